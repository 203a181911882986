#include "render/gl/display_list.h"

#include <cassert>

#include "render/gl/gl_context.h"

namespace cloudreel::gl {

void DisplayList::call() const {
  if (isUsable()) {
    glCallList(list_.get());
  }
}

bool DisplayList::beginCompile(GLenum mode) {
  GLContext* context = GLContext::current();
  assert(context != nullptr);
  if (context == nullptr) {
    return false;
  }
  list_.reset();
  const GLuint name = glGenLists(1);
  if (name == 0) {
    return false;
  }
  list_ = GLName(*context, NameKind::DisplayList, name);
  glNewList(name, mode);
  return true;
}

void DisplayList::endCompile() { glEndList(); }

}  // namespace cloudreel::gl
