#pragma once
// Headless desktop OpenGL contexts from EGL, without any window system.
//
// The EGL device platform comes first (GPU render nodes on servers and
// render nodes); Mesa's surfaceless platform second (software rendering in
// CI). A context is a compatibility context of version 2.1 or later, so the
// fixed-function pipeline is available. It has no default framebuffer:
// everything draws into a Framebuffer object.

#include <memory>
#include <optional>
#include <string>

#include "render/gl/gl_context.h"

namespace cloudreel::gl {

enum class EglPlatform { Device, Surfaceless };

class EglContext final : public GLContext {
 public:
  // A new context in a new share group, not current anywhere. `only`
  // restricts the choice to one platform (to test the fallback, or to avoid
  // a misbehaving driver). On failure answers null and an error that names
  // each platform tried and why it failed.
  [[nodiscard]] static std::unique_ptr<EglContext> createHeadless(
      Error* error = nullptr, std::optional<EglPlatform> only = std::nullopt);

  ~EglContext() override;

  [[nodiscard]] std::unique_ptr<GLContext> createSharedContext(Error* error = nullptr) override;

  EglPlatform platform() const { return platform_; }
  // "EGL device" or "Mesa surfaceless", then the GL_RENDERER and GL_VERSION
  // strings, for logs and benchmark records.
  const std::string& description() const { return description_; }
  // GL_MAJOR_VERSION * 10 + GL_MINOR_VERSION, e.g. 45 for 4.5.
  int glVersion() const { return glVersion_; }

  struct Display;

 private:
  EglContext(std::shared_ptr<Display> display, std::shared_ptr<ShareGroup> group,
             void* nativeContext);

  bool makeCurrentNative(Error* error) override;
  void doneCurrentNative() override;

  std::shared_ptr<Display> display_;
  // The EGLContext handle (EGLContext is a pointer type); kept opaque so
  // this header does not pull EGL into every user of contexts.
  void* nativeContext_;
  EglPlatform platform_ = EglPlatform::Surfaceless;
  std::string description_;
  int glVersion_ = 0;
};

}  // namespace cloudreel::gl
