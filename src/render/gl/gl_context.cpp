#include "render/gl/gl_context.h"

#include <algorithm>
#include <atomic>
#include <cassert>

#include "platform/log.h"
#include "render/gl/gl_name.h"

namespace cloudreel::gl {
namespace {

thread_local GLContext* tCurrentContext = nullptr;
std::atomic<std::uint64_t> gNextContextId{1};

}  // namespace

void ShareGroup::release(NameKind kind, unsigned name, int count, std::uint64_t contextId) {
  const GLContext* current = GLContext::current();
  const bool perContext = isPerContext(kind);
  if (current != nullptr && current->shareGroup().get() == this &&
      (!perContext || current->id() == contextId)) {
    deleteNamesNow(kind, name, count);
    return;
  }
  const std::lock_guard lock(mutex_);
  const bool alive =
      perContext ? std::find(liveContexts_.begin(), liveContexts_.end(), contextId) !=
                       liveContexts_.end()
                 : !liveContexts_.empty();
  // Objects whose contexts are gone were destroyed with them.
  if (alive) {
    pending_.push_back(Pending{kind, name, count, contextId});
  }
}

std::size_t ShareGroup::pendingCount() const {
  const std::lock_guard lock(mutex_);
  return pending_.size();
}

void ShareGroup::addContext(std::uint64_t id) {
  const std::lock_guard lock(mutex_);
  liveContexts_.push_back(id);
}

void ShareGroup::removeContext(std::uint64_t id) {
  const std::lock_guard lock(mutex_);
  std::erase(liveContexts_, id);
  if (liveContexts_.empty()) {
    pending_.clear();
  } else {
    std::erase_if(pending_, [id](const Pending& p) {
      return isPerContext(p.kind) && p.contextId == id;
    });
  }
}

void ShareGroup::runPending(std::uint64_t currentId) {
  std::vector<Pending> due;
  {
    const std::lock_guard lock(mutex_);
    auto split = std::stable_partition(pending_.begin(), pending_.end(), [currentId](const Pending& p) {
      return isPerContext(p.kind) && p.contextId != currentId;
    });
    due.assign(split, pending_.end());
    pending_.erase(split, pending_.end());
  }
  // Deleting outside the lock: a driver call may take a while, and other
  // threads may be releasing names meanwhile.
  for (const Pending& p : due) {
    deleteNamesNow(p.kind, p.name, p.count);
  }
}

GLContext::GLContext(std::shared_ptr<ShareGroup> group)
    : shareGroup_(group ? std::move(group) : std::make_shared<ShareGroup>()),
      id_(gNextContextId.fetch_add(1)) {
  shareGroup_->addContext(id_);
}

GLContext::~GLContext() {
  // A derived class that forgot releaseIfCurrent() would leave the thread
  // pointing at a destroyed object.
  assert(tCurrentContext != this);
  if (tCurrentContext == this) {
    tCurrentContext = nullptr;
  }
  shareGroup_->removeContext(id_);
}

bool GLContext::makeCurrent(Error* error) {
  if (tCurrentContext == this) {
    return true;
  }
  if (!makeCurrentNative(error)) {
    return false;
  }
  tCurrentContext = this;
  shareGroup_->runPending(id_);
  return true;
}

void GLContext::doneCurrent() {
  if (tCurrentContext == this) {
    doneCurrentNative();
    tCurrentContext = nullptr;
  }
}

GLContext* GLContext::current() { return tCurrentContext; }

void GLContext::runPendingDeletions() {
  assert(isCurrent());
  if (isCurrent()) {
    shareGroup_->runPending(id_);
  }
}

void GLContext::releaseIfCurrent() {
  if (tCurrentContext == this) {
    doneCurrentNative();
    tCurrentContext = nullptr;
  }
}

CurrentContext::CurrentContext(GLContext& context, Error* error)
    : context_(context), previous_(GLContext::current()) {
  ok_ = context_.makeCurrent(error);
}

CurrentContext::~CurrentContext() {
  if (previous_ == &context_) {
    return;
  }
  if (previous_ != nullptr) {
    Error error;
    if (!previous_->makeCurrent(&error)) {
      logWarningf("could not make the previous OpenGL context current again: %s", error.message);
    }
  } else {
    context_.doneCurrent();
  }
}

}  // namespace cloudreel::gl
