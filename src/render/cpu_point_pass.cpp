#include "render/cpu_point_pass.h"

#include <epoxy/gl.h>

#include <array>
#include <cstring>
#include <new>

#include "platform/log.h"
#include "render/gl/gl_context.h"
#include "render/gl/pixel_store.h"

namespace cloudreel {

namespace {

constexpr std::string_view kPassDomain = "Cloudreel";
constexpr int kPassErrorCode = 101;

GLint integer(GLenum name) {
  GLint value = 0;
  glGetIntegerv(name, &value);
  return value;
}

// Whether points drawn now would be drawn as the rasteriser draws them.
bool stateIsReproduced() {
  for (const GLenum off :
       {GL_LIGHTING, GL_FOG, GL_POINT_SMOOTH, GL_POINT_SPRITE, GL_SCISSOR_TEST, GL_STENCIL_TEST,
        GL_ALPHA_TEST, GL_COLOR_LOGIC_OP, GL_TEXTURE_1D, GL_TEXTURE_2D, GL_TEXTURE_3D,
        GL_TEXTURE_CUBE_MAP, GL_VERTEX_PROGRAM_POINT_SIZE}) {
    if (glIsEnabled(off) != GL_FALSE) {
      return false;
    }
  }
  if ((epoxy_gl_version() >= 32 || epoxy_has_gl_extension("GL_ARB_depth_clamp")) &&
      glIsEnabled(GL_DEPTH_CLAMP) != GL_FALSE) {
    return false;
  }
  for (GLenum plane = GL_CLIP_PLANE0; plane < GL_CLIP_PLANE0 + 6; ++plane) {
    if (glIsEnabled(plane) != GL_FALSE) {
      return false;
    }
  }
  if (glIsEnabled(GL_DEPTH_TEST) == GL_FALSE || integer(GL_DEPTH_FUNC) != GL_LESS ||
      integer(GL_DEPTH_WRITEMASK) == GL_FALSE || integer(GL_CURRENT_PROGRAM) != 0 ||
      integer(GL_RENDER_MODE) != GL_RENDER || integer(GL_SAMPLE_BUFFERS) != 0) {
    return false;
  }
  std::array<GLboolean, 4> mask{};
  glGetBooleanv(GL_COLOR_WRITEMASK, mask.data());
  if (mask != std::array<GLboolean, 4>{GL_TRUE, GL_TRUE, GL_TRUE, GL_TRUE}) {
    return false;
  }
  std::array<GLfloat, 2> range{};
  glGetFloatv(GL_DEPTH_RANGE, range.data());
  if (range[0] != 0.0f || range[1] != 1.0f) {
    return false;
  }
  // Opaque points come out as their own colour under the renderer's
  // blending, as they do with none.
  if (glIsEnabled(GL_BLEND) != GL_FALSE &&
      (integer(GL_BLEND_SRC_RGB) != GL_SRC_ALPHA || integer(GL_BLEND_SRC_ALPHA) != GL_SRC_ALPHA ||
       integer(GL_BLEND_DST_RGB) != GL_ONE_MINUS_SRC_ALPHA ||
       integer(GL_BLEND_DST_ALPHA) != GL_ONE_MINUS_SRC_ALPHA ||
       integer(GL_BLEND_EQUATION_RGB) != GL_FUNC_ADD ||
       integer(GL_BLEND_EQUATION_ALPHA) != GL_FUNC_ADD)) {
    return false;
  }
  // Sizes are used as given: no attenuation and no clamping below them.
  std::array<GLfloat, 3> attenuation{};
  glGetFloatv(GL_POINT_DISTANCE_ATTENUATION, attenuation.data());
  GLfloat sizeMin = 0.0f;
  glGetFloatv(GL_POINT_SIZE_MIN, &sizeMin);
  return attenuation == std::array<GLfloat, 3>{1.0f, 0.0f, 0.0f} && sizeMin <= 1.0f;
}

std::array<float, 16> matrix(GLenum name) {
  std::array<float, 16> m{};
  glGetFloatv(name, m.data());
  return m;
}

GLenum depthFormat(int bits) {
  return bits >= 32   ? GL_DEPTH_COMPONENT32
         : bits >= 24 ? GL_DEPTH_COMPONENT24
                      : GL_DEPTH_COMPONENT16;
}

}  // namespace

std::optional<PointRasterization> pointRasterizationNamed(std::string_view name) {
  if (name == "auto") {
    return PointRasterization::Auto;
  }
  if (name == "gl") {
    return PointRasterization::OpenGL;
  }
  if (name == "cpu") {
    return PointRasterization::Cpu;
  }
  return std::nullopt;
}

bool currentContextIsSoftware() {
  const auto* renderer = reinterpret_cast<const char*>(glGetString(GL_RENDERER));
  if (renderer == nullptr) {
    return false;
  }
  const std::string_view name(renderer);
  for (const std::string_view software : {"llvmpipe", "softpipe", "Software Rasterizer", "SWR"}) {
    if (name.find(software) != std::string_view::npos) {
      return true;
    }
  }
  return false;
}

CpuPointPass::CpuPointPass(PointRasterizer::Division division) : rasterizer_(division) {}

CpuPointPass::~CpuPointPass() = default;

bool CpuPointPass::supportedByCurrentContext() {
  return epoxy_gl_version() >= 30 || epoxy_has_gl_extension("GL_ARB_framebuffer_object");
}

void CpuPointPass::beginFrame(int width, int height, int depthBits) {
  pending_.clear();
  failure_.reset();
  pointsThisFrame_ = 0;
  held_ = false;
  width_ = std::max(width, 0);
  height_ = std::max(height, 0);
  depthBits_ = depthBits;
  target_ = integer(GL_DRAW_FRAMEBUFFER_BINDING);
}

bool CpuPointPass::submit(PointRasterBatch batch) {
  if (failure_ || !stateIsReproduced()) {
    return false;
  }
  batch.projection = matrix(GL_PROJECTION_MATRIX);
  batch.modelView = matrix(GL_MODELVIEW_MATRIX);
  glGetIntegerv(GL_VIEWPORT, batch.viewport.data());
  pointsThisFrame_ += batch.count;
  pending_.push_back(batch);
  return true;
}

bool CpuPointPass::fail(std::string message) {
  logWarningf("%s", message);
  if (!failure_) {
    Error error;
    setError(&error, std::string(kPassDomain), kPassErrorCode, std::move(message));
    failure_ = std::move(error);
  }
  pending_.clear();
  return false;
}

bool CpuPointPass::flush() { return drawPending() && writeBack(); }

bool CpuPointPass::flushKeepingFrame() { return drawPending(); }

bool CpuPointPass::drawPending() {
  if (pending_.empty()) {
    return !failure_;
  }
  if (width_ == 0 || height_ == 0) {
    pending_.clear();
    return true;
  }
  if (!held_) {
    const auto pixels = static_cast<std::size_t>(width_) * static_cast<std::size_t>(height_);
    try {
      colour_.resize(pixels);
      depth_.resize(pixels);
    } catch (const std::bad_alloc&) {
      return fail("Not enough memory to draw points on the CPU");
    }
    // OpenGL errors are left for the frame's own check after drawing, which
    // reports them whoever caused them.
    const gl::TightPixelStore store;
    const GLint read = integer(GL_READ_FRAMEBUFFER_BINDING);
    glBindFramebuffer(GL_READ_FRAMEBUFFER, static_cast<GLuint>(target_));
    glReadPixels(0, 0, width_, height_, GL_RGBA, GL_UNSIGNED_BYTE, colour_.data());
    glReadPixels(0, 0, width_, height_, GL_DEPTH_COMPONENT, GL_UNSIGNED_INT, depth_.data());
    glBindFramebuffer(GL_READ_FRAMEBUFFER, static_cast<GLuint>(read));
  }
  const PointRasterTarget target{width_, height_, colour_.data(), depth_.data()};
  const bool drawn = rasterizer_.draw(target, pending_);
  pending_.clear();
  if (!drawn) {
    return fail("Not enough memory to draw points on the CPU");
  }
  held_ = true;
  return true;
}

bool CpuPointPass::writeBack() {
  if (!held_) {
    return !failure_;
  }
  held_ = false;
  if (!ensureUploadTarget()) {
    return fail("Cannot make the framebuffer that points drawn on the CPU are written back from");
  }
  const gl::TightPixelStore store;
  const GLint texture = integer(GL_TEXTURE_BINDING_2D);
  glBindTexture(GL_TEXTURE_2D, colourTexture_.get());
  glTexSubImage2D(GL_TEXTURE_2D, 0, 0, 0, width_, height_, GL_RGBA, GL_UNSIGNED_BYTE,
                  colour_.data());
  glBindTexture(GL_TEXTURE_2D, depthTexture_.get());
  glTexSubImage2D(GL_TEXTURE_2D, 0, 0, 0, width_, height_, GL_DEPTH_COMPONENT, GL_UNSIGNED_INT,
                  depth_.data());
  glBindTexture(GL_TEXTURE_2D, static_cast<GLuint>(texture));
  const GLboolean scissor = glIsEnabled(GL_SCISSOR_TEST);
  glDisable(GL_SCISSOR_TEST);
  const GLint read = integer(GL_READ_FRAMEBUFFER_BINDING);
  glBindFramebuffer(GL_READ_FRAMEBUFFER, uploadFramebuffer_.get());
  glBindFramebuffer(GL_DRAW_FRAMEBUFFER, static_cast<GLuint>(target_));
  glBlitFramebuffer(0, 0, width_, height_, 0, 0, width_, height_,
                    GL_COLOR_BUFFER_BIT | GL_DEPTH_BUFFER_BIT, GL_NEAREST);
  glBindFramebuffer(GL_READ_FRAMEBUFFER, static_cast<GLuint>(read));
  if (scissor != GL_FALSE) {
    glEnable(GL_SCISSOR_TEST);
  }
  return true;
}

bool CpuPointPass::ensureUploadTarget() {
  if (uploadFramebuffer_.usableInCurrentContext() && uploadWidth_ == width_ &&
      uploadHeight_ == height_ && uploadDepthBits_ == depthBits_) {
    return true;
  }
  gl::GLContext* context = gl::GLContext::current();
  if (context == nullptr || !supportedByCurrentContext()) {
    return false;
  }
  uploadFramebuffer_.reset();
  colourTexture_.reset();
  depthTexture_.reset();
  const GLint texture = integer(GL_TEXTURE_BINDING_2D);
  const auto makeTexture = [&](GLenum internalFormat, GLenum format, GLenum type) {
    GLuint name = 0;
    glGenTextures(1, &name);
    glBindTexture(GL_TEXTURE_2D, name);
    glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_NEAREST);
    glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_NEAREST);
    glTexImage2D(GL_TEXTURE_2D, 0, static_cast<GLint>(internalFormat), width_, height_, 0, format,
                 type, nullptr);
    return gl::GLName(*context, gl::NameKind::Texture, name);
  };
  colourTexture_ = makeTexture(GL_RGBA8, GL_RGBA, GL_UNSIGNED_BYTE);
  depthTexture_ = makeTexture(depthFormat(depthBits_), GL_DEPTH_COMPONENT, GL_UNSIGNED_INT);
  glBindTexture(GL_TEXTURE_2D, static_cast<GLuint>(texture));
  GLuint name = 0;
  glGenFramebuffers(1, &name);
  uploadFramebuffer_ = gl::GLName(*context, gl::NameKind::Framebuffer, name);
  const GLint previous = integer(GL_FRAMEBUFFER_BINDING);
  glBindFramebuffer(GL_FRAMEBUFFER, name);
  glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, colourTexture_.get(),
                         0);
  glFramebufferTexture2D(GL_FRAMEBUFFER, GL_DEPTH_ATTACHMENT, GL_TEXTURE_2D, depthTexture_.get(),
                         0);
  const GLenum status = glCheckFramebufferStatus(GL_FRAMEBUFFER);
  glBindFramebuffer(GL_FRAMEBUFFER, static_cast<GLuint>(previous));
  if (status != GL_FRAMEBUFFER_COMPLETE) {
    uploadFramebuffer_.reset();
    return false;
  }
  uploadWidth_ = width_;
  uploadHeight_ = height_;
  uploadDepthBits_ = depthBits_;
  return true;
}

}  // namespace cloudreel
