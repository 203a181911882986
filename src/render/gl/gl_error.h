#pragma once
// The error domain and codes of the OpenGL foundation. Messages say what
// failed and why in words a user can act on; the codes let callers and tests
// tell the cases apart.

#include <string_view>

namespace cloudreel::gl {

inline constexpr std::string_view kGLErrorDomain = "cloudreel.gl";

enum class GLErrorCode : int {
  // No headless context could be made: no EGL platform worked.
  ContextUnavailable = 1,
  // A context exists but could not be made current (current on another
  // thread, or lost).
  MakeCurrentFailed = 2,
  // Framebuffer or image dimensions outside what can be allocated.
  InvalidSize = 3,
  // The implementation refused the framebuffer's attachments.
  FramebufferIncomplete = 4,
  // The operation needs a current context and none (or another share
  // group's) is current on this thread.
  NoCurrentContext = 5,
  // The context offers neither core nor EXT framebuffer objects.
  FramebufferUnsupported = 6,
};

}  // namespace cloudreel::gl
