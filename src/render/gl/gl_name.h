#pragma once
// The move-only owner of an OpenGL name. It remembers the share group (and
// for framebuffers the context) the name belongs to and deletes it there
// when the owner goes, now if a suitable context is current on the thread,
// later otherwise (see ShareGroup::release).

#include <epoxy/gl.h>

#include <cstdint>
#include <memory>

namespace cloudreel::gl {

class GLContext;
class ShareGroup;

enum class NameKind : std::uint8_t {
  DisplayList,
  Buffer,
  Texture,
  Renderbuffer,
  RenderbufferExt,
  // Framebuffer objects are containers: they exist only in the context that
  // made them, even when its other objects are shared.
  Framebuffer,
  FramebufferExt,
};

inline bool isPerContext(NameKind kind) {
  return kind == NameKind::Framebuffer || kind == NameKind::FramebufferExt;
}

// Deletes names with a suitable context current on this thread.
void deleteNamesNow(NameKind kind, GLuint name, GLsizei count);

class GLName {
 public:
  GLName() = default;
  // Takes ownership of `count` consecutive names starting at `name` (count
  // is above 1 only for display-list ranges) made in `context`, which must
  // be current.
  GLName(GLContext& context, NameKind kind, GLuint name, GLsizei count = 1);
  ~GLName() { reset(); }
  GLName(GLName&& other) noexcept;
  GLName& operator=(GLName&& other) noexcept;
  GLName(const GLName&) = delete;
  GLName& operator=(const GLName&) = delete;

  GLuint get() const { return name_; }
  NameKind kind() const { return kind_; }
  explicit operator bool() const { return name_ != 0; }
  // True if the name can be used in the context current on this thread:
  // the same share group, and for framebuffers the same context.
  bool usableInCurrentContext() const;
  // Releases the name now (or queues its deletion).
  void reset();

 private:
  std::shared_ptr<ShareGroup> group_;
  std::uint64_t contextId_ = 0;
  GLuint name_ = 0;
  GLsizei count_ = 0;
  NameKind kind_ = NameKind::DisplayList;
};

}  // namespace cloudreel::gl
