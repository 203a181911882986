#pragma once
// Tightly packed client memory for pixel transfers during a scope
// (glReadPixels, glBitmap): alignment 1, no row length or skips, no pixel
// buffer bound. The previous state comes back when the scope ends, so
// callers' settings are never disturbed.

#include <epoxy/gl.h>

namespace cloudreel::gl {

class TightPixelStore {
 public:
  TightPixelStore() {
    glPushClientAttrib(GL_CLIENT_PIXEL_STORE_BIT);
    for (GLenum alignment : {GL_PACK_ALIGNMENT, GL_UNPACK_ALIGNMENT}) {
      glPixelStorei(alignment, 1);
    }
    for (GLenum zero : {GL_PACK_ROW_LENGTH, GL_PACK_SKIP_ROWS, GL_PACK_SKIP_PIXELS,
                        GL_PACK_SWAP_BYTES, GL_PACK_LSB_FIRST, GL_UNPACK_ROW_LENGTH,
                        GL_UNPACK_SKIP_ROWS, GL_UNPACK_SKIP_PIXELS, GL_UNPACK_SWAP_BYTES,
                        GL_UNPACK_LSB_FIRST}) {
      glPixelStorei(zero, 0);
    }
    // A bound pixel buffer would turn the client pointer into an offset.
    if (epoxy_gl_version() >= 21) {
      glGetIntegerv(GL_PIXEL_PACK_BUFFER_BINDING, &packBuffer_);
      glGetIntegerv(GL_PIXEL_UNPACK_BUFFER_BINDING, &unpackBuffer_);
      glBindBuffer(GL_PIXEL_PACK_BUFFER, 0);
      glBindBuffer(GL_PIXEL_UNPACK_BUFFER, 0);
    }
  }
  ~TightPixelStore() {
    if (packBuffer_ != 0) {
      glBindBuffer(GL_PIXEL_PACK_BUFFER, static_cast<GLuint>(packBuffer_));
    }
    if (unpackBuffer_ != 0) {
      glBindBuffer(GL_PIXEL_UNPACK_BUFFER, static_cast<GLuint>(unpackBuffer_));
    }
    glPopClientAttrib();
  }
  TightPixelStore(const TightPixelStore&) = delete;
  TightPixelStore& operator=(const TightPixelStore&) = delete;

 private:
  GLint packBuffer_ = 0;
  GLint unpackBuffer_ = 0;
};

}  // namespace cloudreel::gl
