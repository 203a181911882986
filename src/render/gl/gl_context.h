#pragma once
// A rendering context, whatever made it. Headless contexts come from EGL
// (egl_context.h); the Qt shell wraps the contexts of its windows in the same
// interface, so drawing code never asks where its context came from.
//
// Contexts that share objects (display lists, buffers, textures,
// renderbuffers) belong to one ShareGroup. Every GL name has a move-only
// owner (GLName) that deletes it with a context of its group current; when no
// such context is current on the deleting thread, the deletion waits in the
// group until one is made current.

#include <cstdint>
#include <memory>
#include <mutex>
#include <vector>

#include "platform/error.h"

namespace cloudreel::gl {

class GLContext;
enum class NameKind : std::uint8_t;

// The bookkeeping shared by the contexts of one share group: which of them
// are alive, and which deletions wait for one of them to be current.
class ShareGroup {
 public:
  ShareGroup() = default;
  ShareGroup(const ShareGroup&) = delete;
  ShareGroup& operator=(const ShareGroup&) = delete;

  // Deletes `count` names starting at `name` now if a suitable context is
  // current on this thread, queues the deletion otherwise, and forgets it
  // when the objects already went with their context. Per-context kinds
  // (framebuffers) need exactly `contextId` current; shared kinds any
  // context of this group.
  void release(NameKind kind, unsigned name, int count, std::uint64_t contextId);

  // Deletions still waiting for a context (for tests and diagnostics).
  std::size_t pendingCount() const;

 private:
  friend class GLContext;
  struct Pending {
    NameKind kind;
    unsigned name;
    int count;
    std::uint64_t contextId;
  };

  void addContext(std::uint64_t id);
  void removeContext(std::uint64_t id);
  // Runs the waiting deletions that `currentId` (current on this thread) may
  // perform.
  void runPending(std::uint64_t currentId);

  mutable std::mutex mutex_;
  std::vector<std::uint64_t> liveContexts_;
  std::vector<Pending> pending_;
};

class GLContext {
 public:
  virtual ~GLContext();
  GLContext(const GLContext&) = delete;
  GLContext& operator=(const GLContext&) = delete;

  // Makes this context current on the calling thread and runs the deletions
  // waiting for it. Fails if the context is current on another thread.
  [[nodiscard]] bool makeCurrent(Error* error = nullptr);
  // Releases this context from the calling thread; nothing happens if it is
  // not the current one.
  void doneCurrent();
  bool isCurrent() const { return current() == this; }
  // The context current on the calling thread, among those made current
  // through this interface; null if none.
  static GLContext* current();

  // A new context in this context's share group, made with the same
  // configuration. It is not current anywhere yet, so it can be handed to a
  // background thread.
  [[nodiscard]] virtual std::unique_ptr<GLContext> createSharedContext(Error* error = nullptr) = 0;

  const std::shared_ptr<ShareGroup>& shareGroup() const { return shareGroup_; }
  bool sharesObjectsWith(const GLContext& other) const {
    return shareGroup_ == other.shareGroup_;
  }
  // Unique for the life of the process, unlike the object's address.
  std::uint64_t id() const { return id_; }

  // Runs waiting deletions now; the context must be current. A thread that
  // keeps one context current for a long time calls this now and then so
  // that names released on other threads do not pile up.
  void runPendingDeletions();

 protected:
  // A null group starts a new share group.
  explicit GLContext(std::shared_ptr<ShareGroup> group);

  virtual bool makeCurrentNative(Error* error) = 0;
  virtual void doneCurrentNative() = 0;
  // Derived destructors call this before destroying the native context, so
  // that a context is never destroyed while current on its own thread.
  void releaseIfCurrent();

 private:
  std::shared_ptr<ShareGroup> shareGroup_;
  std::uint64_t id_;
};

// Makes a context current for a scope and puts back whatever was current on
// the thread before (or nothing).
class CurrentContext {
 public:
  explicit CurrentContext(GLContext& context, Error* error = nullptr);
  ~CurrentContext();
  CurrentContext(const CurrentContext&) = delete;
  CurrentContext& operator=(const CurrentContext&) = delete;

  // False if the context could not be made current; the error says why.
  bool ok() const { return ok_; }
  explicit operator bool() const { return ok_; }

 private:
  GLContext& context_;
  GLContext* previous_;
  bool ok_ = false;
};

}  // namespace cloudreel::gl
