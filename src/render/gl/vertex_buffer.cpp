#include "render/gl/vertex_buffer.h"

#include <limits>

#include "render/gl/gl_context.h"

namespace cloudreel::gl {

void* VertexBuffer::allocateAndMap(std::size_t size) {
  reset();
  GLContext* context = GLContext::current();
  if (context == nullptr || size == 0 ||
      size > static_cast<std::size_t>(std::numeric_limits<GLsizeiptr>::max())) {
    return nullptr;
  }
  // Errors left by earlier drawing are not ours to report; clear them so
  // the checks below see only what the allocation did.
  while (glGetError() != GL_NO_ERROR) {
  }
  GLuint name = 0;
  glGenBuffers(1, &name);
  if (name == 0) {
    return nullptr;
  }
  buffer_ = GLName(*context, NameKind::Buffer, name);
  glBindBuffer(GL_ARRAY_BUFFER, name);
  glBufferData(GL_ARRAY_BUFFER, static_cast<GLsizeiptr>(size), nullptr, GL_STATIC_DRAW);
  void* mapping =
      glGetError() == GL_NO_ERROR ? glMapBuffer(GL_ARRAY_BUFFER, GL_WRITE_ONLY) : nullptr;
  glBindBuffer(GL_ARRAY_BUFFER, 0);
  if (mapping == nullptr) {
    reset();
    return nullptr;
  }
  size_ = size;
  return mapping;
}

bool VertexBuffer::unmap() {
  if (!buffer_) {
    return false;
  }
  glBindBuffer(GL_ARRAY_BUFFER, buffer_.get());
  const bool intact = glUnmapBuffer(GL_ARRAY_BUFFER) == GL_TRUE;
  glBindBuffer(GL_ARRAY_BUFFER, 0);
  if (!intact) {
    reset();
  }
  return intact;
}

VertexBuffer::Binding::Binding(const VertexBuffer& buffer) {
  glBindBuffer(GL_ARRAY_BUFFER, buffer.buffer_.get());
}

VertexBuffer::Binding::~Binding() { glBindBuffer(GL_ARRAY_BUFFER, 0); }

}  // namespace cloudreel::gl
