#include "render/gl/framebuffer.h"

#include <algorithm>
#include <bit>
#include <cstdio>
#include <cstring>
#include <string>

#include "render/gl/gl_context.h"
#include "render/gl/gl_error.h"
#include "render/gl/pixel_store.h"

namespace cloudreel::gl {
namespace {

// The EXT and core entry points take the same enum values; only the
// functions differ.
void genFramebuffer(FramebufferApi api, GLuint* name) {
  api == FramebufferApi::Ext ? glGenFramebuffersEXT(1, name) : glGenFramebuffers(1, name);
}
void genRenderbuffer(FramebufferApi api, GLuint* name) {
  api == FramebufferApi::Ext ? glGenRenderbuffersEXT(1, name) : glGenRenderbuffers(1, name);
}
void bindRenderbuffer(FramebufferApi api, GLuint name) {
  api == FramebufferApi::Ext ? glBindRenderbufferEXT(GL_RENDERBUFFER, name)
                             : glBindRenderbuffer(GL_RENDERBUFFER, name);
}
void renderbufferStorage(FramebufferApi api, GLenum format, int width, int height) {
  api == FramebufferApi::Ext ? glRenderbufferStorageEXT(GL_RENDERBUFFER, format, width, height)
                             : glRenderbufferStorage(GL_RENDERBUFFER, format, width, height);
}
void attachRenderbuffer(FramebufferApi api, GLenum attachment, GLuint name) {
  api == FramebufferApi::Ext
      ? glFramebufferRenderbufferEXT(GL_FRAMEBUFFER, attachment, GL_RENDERBUFFER, name)
      : glFramebufferRenderbuffer(GL_FRAMEBUFFER, attachment, GL_RENDERBUFFER, name);
}
GLenum framebufferStatus(FramebufferApi api) {
  return api == FramebufferApi::Ext ? glCheckFramebufferStatusEXT(GL_FRAMEBUFFER)
                                    : glCheckFramebufferStatus(GL_FRAMEBUFFER);
}
GLint renderbufferParameter(FramebufferApi api, GLenum parameter) {
  GLint value = 0;
  api == FramebufferApi::Ext ? glGetRenderbufferParameterivEXT(GL_RENDERBUFFER, parameter, &value)
                             : glGetRenderbufferParameteriv(GL_RENDERBUFFER, parameter, &value);
  return value;
}

// Errors left by earlier calls would be blamed on ours.
void discardGLErrors() {
  for (int i = 0; i < 32 && glGetError() != GL_NO_ERROR; ++i) {
  }
}

std::string hex(unsigned value) {
  char text[16];
  std::snprintf(text, sizeof text, "0x%04X", value);
  return text;
}

bool fail(Error* error, GLErrorCode code, std::string message) {
  setError(error, std::string(kGLErrorDomain), static_cast<int>(code), std::move(message));
  return false;
}

bool coreAvailable() {
  return epoxy_gl_version() >= 30 || epoxy_has_gl_extension("GL_ARB_framebuffer_object");
}
bool extAvailable() { return epoxy_has_gl_extension("GL_EXT_framebuffer_object"); }

}  // namespace

std::optional<Framebuffer> Framebuffer::create(int width, int height, Error* error,
                                               FramebufferApi api, unsigned* incompleteStatus) {
  GLContext* context = GLContext::current();
  if (context == nullptr) {
    fail(error, GLErrorCode::NoCurrentContext, "No OpenGL context is current to make a framebuffer in.");
    return std::nullopt;
  }
  if (width <= 0 || height <= 0) {
    fail(error, GLErrorCode::InvalidSize,
         "Cannot make an empty " + std::to_string(width) + "×" + std::to_string(height) +
             " framebuffer.");
    return std::nullopt;
  }
  if (api == FramebufferApi::Automatic) {
    api = coreAvailable() ? FramebufferApi::Core : FramebufferApi::Ext;
  }
  if ((api == FramebufferApi::Core && !coreAvailable()) ||
      (api == FramebufferApi::Ext && !extAvailable())) {
    fail(error, GLErrorCode::FramebufferUnsupported,
         api == FramebufferApi::Core
             ? "The OpenGL context has no framebuffer objects (needs OpenGL 3.0 or ARB_framebuffer_object)."
             : "The OpenGL context lacks EXT_framebuffer_object.");
    return std::nullopt;
  }
  GLint maxRenderbuffer = 0;
  GLint maxViewport[2] = {0, 0};
  glGetIntegerv(GL_MAX_RENDERBUFFER_SIZE, &maxRenderbuffer);
  glGetIntegerv(GL_MAX_VIEWPORT_DIMS, maxViewport);
  const int maxWidth = std::min(maxRenderbuffer, maxViewport[0]);
  const int maxHeight = std::min(maxRenderbuffer, maxViewport[1]);
  if (width > maxWidth || height > maxHeight) {
    fail(error, GLErrorCode::InvalidSize,
         "A " + std::to_string(width) + "×" + std::to_string(height) +
             " framebuffer is larger than this OpenGL implementation allows (" +
             std::to_string(maxWidth) + "×" + std::to_string(maxHeight) + ").");
    return std::nullopt;
  }

  discardGLErrors();
  Framebuffer result;
  result.width_ = width;
  result.height_ = height;
  result.api_ = api;
  const bool ext = api == FramebufferApi::Ext;
  GLuint name = 0;
  genFramebuffer(api, &name);
  result.framebuffer_ = GLName(*context, ext ? NameKind::FramebufferExt : NameKind::Framebuffer, name);
  genRenderbuffer(api, &name);
  result.color_ = GLName(*context, ext ? NameKind::RenderbufferExt : NameKind::Renderbuffer, name);
  genRenderbuffer(api, &name);
  result.depth_ = GLName(*context, ext ? NameKind::RenderbufferExt : NameKind::Renderbuffer, name);

  GLint previousRenderbuffer = 0;
  glGetIntegerv(GL_RENDERBUFFER_BINDING, &previousRenderbuffer);
  const FramebufferBinding binding(result);
  bindRenderbuffer(api, result.color_.get());
  renderbufferStorage(api, GL_RGBA8, width, height);
  attachRenderbuffer(api, GL_COLOR_ATTACHMENT0, result.color_.get());
  glDrawBuffer(GL_COLOR_ATTACHMENT0);
  glReadBuffer(GL_COLOR_ATTACHMENT0);
  GLenum status = GL_FRAMEBUFFER_UNSUPPORTED;
  GLenum glError = glGetError();
  if (glError == GL_NO_ERROR) {
    // The deepest depth buffer that the implementation accepts: the
    // application asks for 32 bits, many implementations stop at 24.
    bindRenderbuffer(api, result.depth_.get());
    for (GLenum format : {GL_DEPTH_COMPONENT32, GL_DEPTH_COMPONENT24, GL_DEPTH_COMPONENT16}) {
      renderbufferStorage(api, format, width, height);
      glError = glGetError();
      if (glError == GL_OUT_OF_MEMORY) {
        break;
      }
      if (glError != GL_NO_ERROR) {
        continue;
      }
      attachRenderbuffer(api, GL_DEPTH_ATTACHMENT, result.depth_.get());
      status = framebufferStatus(api);
      if (status == GL_FRAMEBUFFER_COMPLETE) {
        result.depthBits_ = renderbufferParameter(api, GL_RENDERBUFFER_DEPTH_SIZE);
        break;
      }
    }
  }
  bindRenderbuffer(api, static_cast<GLuint>(previousRenderbuffer));
  if (glError == GL_OUT_OF_MEMORY) {
    fail(error, GLErrorCode::InvalidSize,
         "Out of graphics memory for a " + std::to_string(width) + "×" + std::to_string(height) +
             " framebuffer.");
    return std::nullopt;
  }
  if (status != GL_FRAMEBUFFER_COMPLETE) {
    if (incompleteStatus != nullptr) {
      *incompleteStatus = status;
    }
    fail(error, GLErrorCode::FramebufferIncomplete,
         "The OpenGL implementation refused the framebuffer (status " + hex(status) +
             ", error " + hex(glError) + ").");
    return std::nullopt;
  }
  return result;
}

bool Framebuffer::readColor(RgbaImage& out, Error* error) const {
  if (!framebuffer_.usableInCurrentContext()) {
    out = RgbaImage{};
    return fail(error, GLErrorCode::NoCurrentContext,
                "The framebuffer's OpenGL context is not current on this thread.");
  }
  out.width = width_;
  out.height = height_;
  out.pixels.resize(out.rowBytes() * static_cast<std::size_t>(height_));
  {
    const FramebufferBinding binding(*this);
    const TightPixelStore store;
    discardGLErrors();
    // With the _REV packing the red component sits in the lowest bits of
    // each 32-bit word, which on a little-endian machine is the first byte.
    glReadPixels(0, 0, width_, height_, GL_RGBA, GL_UNSIGNED_INT_8_8_8_8_REV, out.pixels.data());
    if (const GLenum glError = glGetError(); glError != GL_NO_ERROR) {
      out = RgbaImage{};
      return fail(error, GLErrorCode::FramebufferIncomplete,
                  "Reading the colour of the framebuffer failed (error " + hex(glError) + ").");
    }
  }
  if constexpr (std::endian::native == std::endian::big) {
    for (std::size_t i = 0; i < out.pixels.size(); i += 4) {
      std::uint32_t word = 0;
      std::memcpy(&word, &out.pixels[i], 4);
      for (std::size_t c = 0; c < 4; ++c) {
        out.pixels[i + c] = static_cast<std::uint8_t>(word >> (8 * c));
      }
    }
  }
  flipRows(out.pixels, out.rowBytes(), static_cast<std::size_t>(height_));
  return true;
}

bool Framebuffer::readDepth(DepthImage& out, Error* error) const {
  if (!framebuffer_.usableInCurrentContext()) {
    out = DepthImage{};
    return fail(error, GLErrorCode::NoCurrentContext,
                "The framebuffer's OpenGL context is not current on this thread.");
  }
  out.width = width_;
  out.height = height_;
  out.values.resize(static_cast<std::size_t>(width_) * static_cast<std::size_t>(height_));
  {
    const FramebufferBinding binding(*this);
    const TightPixelStore store;
    discardGLErrors();
    glReadPixels(0, 0, width_, height_, GL_DEPTH_COMPONENT, GL_UNSIGNED_SHORT, out.values.data());
    if (const GLenum glError = glGetError(); glError != GL_NO_ERROR) {
      out = DepthImage{};
      return fail(error, GLErrorCode::FramebufferIncomplete,
                  "Reading the depth of the framebuffer failed (error " + hex(glError) + ").");
    }
  }
  flipRows(out.values, static_cast<std::size_t>(width_), static_cast<std::size_t>(height_));
  return true;
}

void Framebuffer::bind() const {
  if (api_ == FramebufferApi::Ext) {
    glBindFramebufferEXT(GL_FRAMEBUFFER_EXT, framebuffer_.get());
  } else {
    glBindFramebuffer(GL_FRAMEBUFFER, framebuffer_.get());
  }
  glViewport(0, 0, width_, height_);
}

FramebufferBinding::FramebufferBinding(const Framebuffer& framebuffer) : api_(framebuffer.api_) {
  glGetIntegerv(GL_VIEWPORT, previousViewport_);
  if (api_ == FramebufferApi::Ext) {
    glGetIntegerv(GL_FRAMEBUFFER_BINDING_EXT, &previousDraw_);
  } else {
    glGetIntegerv(GL_DRAW_FRAMEBUFFER_BINDING, &previousDraw_);
    glGetIntegerv(GL_READ_FRAMEBUFFER_BINDING, &previousRead_);
  }
  framebuffer.bind();
}

FramebufferBinding::~FramebufferBinding() {
  if (api_ == FramebufferApi::Ext) {
    glBindFramebufferEXT(GL_FRAMEBUFFER_EXT, static_cast<GLuint>(previousDraw_));
  } else {
    glBindFramebuffer(GL_DRAW_FRAMEBUFFER, static_cast<GLuint>(previousDraw_));
    glBindFramebuffer(GL_READ_FRAMEBUFFER, static_cast<GLuint>(previousRead_));
  }
  glViewport(previousViewport_[0], previousViewport_[1], previousViewport_[2],
             previousViewport_[3]);
}

}  // namespace cloudreel::gl
