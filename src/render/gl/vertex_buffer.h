#pragma once
// An array buffer of vertex data owned like every other GL name: made in the
// current context, usable throughout its share group, deleted with its
// owner. It is filled once through a write mapping, so a large cloud goes to
// the driver without a second copy in client memory.

#include <cstddef>

#include "render/gl/gl_name.h"

namespace cloudreel::gl {

class VertexBuffer {
 public:
  VertexBuffer() = default;

  // Replaces the buffer by one of `size` bytes in the current context and
  // maps it for writing. Answers the mapping, or null (and no buffer) for
  // size 0, when no context is current, or when the driver cannot provide
  // the memory. Finish
  // with unmap() before drawing from it.
  void* allocateAndMap(std::size_t size);
  // Ends the write mapping; false (and no buffer) when the driver lost the
  // contents meanwhile.
  bool unmap();

  // True if a buffer exists and the current context can draw from it.
  bool isUsable() const { return buffer_.usableInCurrentContext(); }
  std::size_t size() const { return size_; }
  void reset() {
    buffer_.reset();
    size_ = 0;
  }

  // Binds the buffer as GL_ARRAY_BUFFER for as long as the binding lives;
  // the previous binding is not restored, the array-buffer binding goes
  // back to none.
  class Binding {
   public:
    explicit Binding(const VertexBuffer& buffer);
    ~Binding();
    Binding(const Binding&) = delete;
    Binding& operator=(const Binding&) = delete;
  };

 private:
  GLName buffer_;
  std::size_t size_ = 0;
};

}  // namespace cloudreel::gl
