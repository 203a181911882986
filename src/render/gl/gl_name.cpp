#include "render/gl/gl_name.h"

#include <cassert>
#include <utility>

#include "render/gl/gl_context.h"

namespace cloudreel::gl {

void deleteNamesNow(NameKind kind, GLuint name, GLsizei count) {
  switch (kind) {
    case NameKind::DisplayList:
      glDeleteLists(name, count);
      return;
    case NameKind::Buffer:
      glDeleteBuffers(1, &name);
      return;
    case NameKind::Texture:
      glDeleteTextures(1, &name);
      return;
    case NameKind::Renderbuffer:
      glDeleteRenderbuffers(1, &name);
      return;
    case NameKind::RenderbufferExt:
      glDeleteRenderbuffersEXT(1, &name);
      return;
    case NameKind::Framebuffer:
      glDeleteFramebuffers(1, &name);
      return;
    case NameKind::FramebufferExt:
      glDeleteFramebuffersEXT(1, &name);
      return;
  }
}

GLName::GLName(GLContext& context, NameKind kind, GLuint name, GLsizei count)
    : group_(context.shareGroup()), contextId_(context.id()), name_(name), count_(count),
      kind_(kind) {
  assert(context.isCurrent());
  assert(count >= 1);
}

GLName::GLName(GLName&& other) noexcept
    : group_(std::move(other.group_)), contextId_(other.contextId_),
      name_(std::exchange(other.name_, 0)), count_(other.count_), kind_(other.kind_) {}

GLName& GLName::operator=(GLName&& other) noexcept {
  if (this != &other) {
    reset();
    group_ = std::move(other.group_);
    contextId_ = other.contextId_;
    name_ = std::exchange(other.name_, 0);
    count_ = other.count_;
    kind_ = other.kind_;
  }
  return *this;
}

bool GLName::usableInCurrentContext() const {
  const GLContext* current = GLContext::current();
  if (name_ == 0 || current == nullptr || current->shareGroup() != group_) {
    return false;
  }
  return !isPerContext(kind_) || current->id() == contextId_;
}

void GLName::reset() {
  if (name_ != 0) {
    group_->release(kind_, name_, count_, contextId_);
    name_ = 0;
  }
  group_.reset();
}

}  // namespace cloudreel::gl
