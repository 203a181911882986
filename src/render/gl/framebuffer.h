#pragma once
// An off-screen render target: a framebuffer object with an RGBA8 colour
// renderbuffer and the deepest depth renderbuffer the implementation gives.
// Headless contexts have no default framebuffer, so all drawing lands here.
// Colour and depth read back top row first, ready for the image files.

#include <optional>

#include "platform/error.h"
#include "render/gl/gl_name.h"
#include "render/gl/image.h"

namespace cloudreel::gl {

// Which framebuffer-object entry points to use. Automatic takes the core
// ones (OpenGL 3.0 or ARB_framebuffer_object) and falls back to
// EXT_framebuffer_object on older contexts.
enum class FramebufferApi { Automatic, Core, Ext };

class Framebuffer {
 public:
  // Makes a framebuffer in the current context. Answers nothing, with an
  // InvalidSize error, for an empty size (0 or negative) or one beyond the
  // implementation's renderbuffer and viewport limits; FramebufferIncomplete
  // if the implementation refuses the attachments or runs out of memory;
  // then `incompleteStatus`, when given, receives the completeness status.
  [[nodiscard]] static std::optional<Framebuffer> create(int width, int height,
                                                         Error* error = nullptr,
                                                         FramebufferApi api = FramebufferApi::Automatic,
                                                         unsigned* incompleteStatus = nullptr);

  int width() const { return width_; }
  int height() const { return height_; }
  // Bits of the depth renderbuffer actually allocated (32, 24 or 16).
  int depthBits() const { return depthBits_; }
  // Core or Ext, never Automatic.
  FramebufferApi api() const { return api_; }

  // Read back the whole frame, top row first, into `out`, whose memory is
  // reused when it already has the frame's size (a render reads every frame
  // into the same image). The framebuffer's context must be current; otherwise answer
  // false with a NoCurrentContext error and leave `out` empty.
  [[nodiscard]] bool readColor(RgbaImage& out, Error* error = nullptr) const;
  [[nodiscard]] bool readDepth(DepthImage& out, Error* error = nullptr) const;

  // Binds it for drawing and reading in the current context and sets the
  // viewport to all of it, for good: for a context that draws only here
  // (FramebufferBinding binds for a scope).
  void bind() const;

 private:
  friend class FramebufferBinding;
  Framebuffer() = default;

  GLName framebuffer_;
  GLName color_;
  GLName depth_;
  int width_ = 0;
  int height_ = 0;
  int depthBits_ = 0;
  FramebufferApi api_ = FramebufferApi::Core;
};

// Binds a framebuffer for drawing and reading and sets the viewport to all
// of it for a scope; the previous bindings and viewport come back after.
class FramebufferBinding {
 public:
  explicit FramebufferBinding(const Framebuffer& framebuffer);
  ~FramebufferBinding();
  FramebufferBinding(const FramebufferBinding&) = delete;
  FramebufferBinding& operator=(const FramebufferBinding&) = delete;

 private:
  FramebufferApi api_;
  GLint previousDraw_ = 0;
  GLint previousRead_ = 0;
  GLint previousViewport_[4] = {0, 0, 0, 0};
};

}  // namespace cloudreel::gl
