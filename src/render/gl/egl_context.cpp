#include "render/gl/egl_context.h"

#include <dlfcn.h>
#include <epoxy/egl.h>
#include <epoxy/gl.h>

#include <algorithm>
#include <map>
#include <mutex>
#include <string_view>
#include <vector>

#include "platform/log.h"
#include "render/gl/gl_error.h"

namespace cloudreel::gl {

// One initialised EGL display, shared by every context on it.
//
// Displays stay initialised until the process ends. eglTerminate ends a
// display for every user in the process, including components that
// initialised it themselves (a toolkit's own EGL use), and Mesa unloads its
// driver on termination while leaving some of the driver's allocations
// behind; one display per device for the life of the process costs little.
struct EglContext::Display {
  EGLDisplay handle = EGL_NO_DISPLAY;
  EGLConfig config = nullptr;
  EglPlatform platform = EglPlatform::Surfaceless;
  bool versionedContexts = false;
};

namespace {

std::mutex gDisplayMutex;
std::map<EGLDisplay, std::shared_ptr<EglContext::Display>> gDisplays;

bool hasExtension(const char* list, std::string_view name) {
  if (list == nullptr) {
    return false;
  }
  std::string_view rest(list);
  while (!rest.empty()) {
    const std::size_t end = rest.find(' ');
    if (rest.substr(0, end) == name) {
      return true;
    }
    if (end == std::string_view::npos) {
      break;
    }
    rest.remove_prefix(end + 1);
  }
  return false;
}

std::string eglErrorName(EGLint code) {
  switch (code) {
    case EGL_SUCCESS: return "EGL_SUCCESS";
    case EGL_NOT_INITIALIZED: return "EGL_NOT_INITIALIZED";
    case EGL_BAD_ACCESS: return "EGL_BAD_ACCESS (current on another thread)";
    case EGL_BAD_ALLOC: return "EGL_BAD_ALLOC";
    case EGL_BAD_ATTRIBUTE: return "EGL_BAD_ATTRIBUTE";
    case EGL_BAD_CONFIG: return "EGL_BAD_CONFIG";
    case EGL_BAD_CONTEXT: return "EGL_BAD_CONTEXT";
    case EGL_BAD_DISPLAY: return "EGL_BAD_DISPLAY";
    case EGL_BAD_MATCH: return "EGL_BAD_MATCH";
    case EGL_BAD_PARAMETER: return "EGL_BAD_PARAMETER";
    case EGL_CONTEXT_LOST: return "EGL_CONTEXT_LOST";
    default: return "EGL error " + std::to_string(code);
  }
}

std::string lastEglError() { return eglErrorName(eglGetError()); }

// libepoxy aborts the process when libEGL cannot be loaded, so look first.
bool eglLibraryPresent() {
  static const bool present = dlopen("libEGL.so.1", RTLD_LAZY | RTLD_LOCAL) != nullptr;
  return present;
}

// Initialises a display (once per process) and picks a configuration for
// desktop OpenGL without surfaces. Answers null and why.
std::shared_ptr<EglContext::Display> openDisplay(EGLDisplay handle, EglPlatform platform,
                                                 std::string* why) {
  if (handle == EGL_NO_DISPLAY) {
    *why = "no display (" + lastEglError() + ")";
    return nullptr;
  }
  const std::lock_guard lock(gDisplayMutex);
  if (auto it = gDisplays.find(handle); it != gDisplays.end()) {
    return it->second;
  }
  EGLint major = 0;
  EGLint minor = 0;
  if (eglInitialize(handle, &major, &minor) == EGL_FALSE) {
    *why = "eglInitialize failed (" + lastEglError() + ")";
    return nullptr;
  }
  // An unusable display is left initialised too: initialising again is
  // harmless, terminating could pull it from under another user.
  auto fail = [&](std::string reason) {
    *why = std::move(reason);
    return nullptr;
  };
  const char* extensions = eglQueryString(handle, EGL_EXTENSIONS);
  if (!hasExtension(eglQueryString(handle, EGL_CLIENT_APIS), "OpenGL")) {
    return fail("the display offers no desktop OpenGL");
  }
  if (!hasExtension(extensions, "EGL_KHR_surfaceless_context")) {
    return fail("the display lacks EGL_KHR_surfaceless_context");
  }
  EGLConfig config = EGL_NO_CONFIG_KHR;
  if (!hasExtension(extensions, "EGL_KHR_no_config_context") &&
      !hasExtension(extensions, "EGL_MESA_configless_context")) {
    // Surface type 0: no surface is ever made, so any configuration does.
    const EGLint attributes[] = {EGL_RENDERABLE_TYPE, EGL_OPENGL_BIT, EGL_SURFACE_TYPE, 0,
                                 EGL_NONE};
    EGLint count = 0;
    if (eglChooseConfig(handle, attributes, &config, 1, &count) == EGL_FALSE || count < 1) {
      return fail("no configuration for desktop OpenGL (" + lastEglError() + ")");
    }
  }
  auto display = std::make_shared<EglContext::Display>(EglContext::Display{
      handle, config, platform,
      major > 1 || minor >= 5 || hasExtension(extensions, "EGL_KHR_create_context")});
  gDisplays[handle] = display;
  return display;
}

// Answers null and why on failure. `share` is EGL_NO_CONTEXT for a new
// share group.
EGLContext createNativeContext(const EglContext::Display& display, EGLContext share,
                               std::string* why) {
  // The bound API is per thread, and EGL's default is OpenGL ES.
  if (eglBindAPI(EGL_OPENGL_API) == EGL_FALSE) {
    *why = "EGL cannot bind desktop OpenGL (" + lastEglError() + ")";
    return EGL_NO_CONTEXT;
  }
  // Asking for 2.1 gets the newest version that keeps the fixed-function
  // pipeline: below 3.2 there is no core profile to fall into.
  const EGLint versioned[] = {EGL_CONTEXT_MAJOR_VERSION, 2, EGL_CONTEXT_MINOR_VERSION, 1,
                              EGL_NONE};
  const EGLint plain[] = {EGL_NONE};
  EGLContext context = eglCreateContext(display.handle, display.config, share,
                                        display.versionedContexts ? versioned : plain);
  if (context == EGL_NO_CONTEXT) {
    *why = "eglCreateContext failed (" + lastEglError() + ")";
  }
  return context;
}

struct Probe {
  bool usable = false;
  int version = 0;
  std::string renderer;
  std::string why;
};

// Makes the new context current for a moment to check that it really is a
// desktop compatibility context, then puts back whatever was current.
Probe probeContext(EGLDisplay display, EGLContext context) {
  Probe probe;
  const EGLDisplay previousDisplay = eglGetCurrentDisplay();
  const EGLSurface previousDraw = eglGetCurrentSurface(EGL_DRAW);
  const EGLSurface previousRead = eglGetCurrentSurface(EGL_READ);
  const EGLContext previousContext = eglGetCurrentContext();
  if (eglMakeCurrent(display, EGL_NO_SURFACE, EGL_NO_SURFACE, context) == EGL_FALSE) {
    probe.why = "the new context cannot be made current without a surface (" +
                lastEglError() + ")";
    return probe;
  }
  if (!epoxy_is_desktop_gl()) {
    probe.why = "the context is not desktop OpenGL";
  } else {
    probe.version = epoxy_gl_version();
    GLint profile = 0;
    if (probe.version >= 32) {
      glGetIntegerv(GL_CONTEXT_PROFILE_MASK, &profile);
    }
    if (probe.version < 21) {
      probe.why = "OpenGL " + std::to_string(probe.version / 10) + "." +
                  std::to_string(probe.version % 10) + " is older than 2.1";
    } else if ((profile & GL_CONTEXT_CORE_PROFILE_BIT) != 0) {
      probe.why = "only a core profile without the fixed-function pipeline";
    } else {
      probe.usable = true;
      auto text = [](GLenum name) {
        const auto* s = reinterpret_cast<const char*>(glGetString(name));
        return std::string(s != nullptr ? s : "?");
      };
      probe.renderer = text(GL_RENDERER) + ", OpenGL " + text(GL_VERSION);
    }
  }
  if (previousContext != EGL_NO_CONTEXT) {
    eglMakeCurrent(previousDisplay, previousDraw, previousRead, previousContext);
  } else {
    eglMakeCurrent(display, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
  }
  return probe;
}

struct Attempt {
  std::shared_ptr<EglContext::Display> display;
  EGLContext context = EGL_NO_CONTEXT;
  Probe probe;
};

Attempt tryDisplay(EGLDisplay handle, EglPlatform platform, std::string* why) {
  Attempt attempt;
  attempt.display = openDisplay(handle, platform, why);
  if (!attempt.display) {
    return attempt;
  }
  attempt.context = createNativeContext(*attempt.display, EGL_NO_CONTEXT, why);
  if (attempt.context == EGL_NO_CONTEXT) {
    attempt.display.reset();
    return attempt;
  }
  attempt.probe = probeContext(handle, attempt.context);
  if (!attempt.probe.usable) {
    *why = attempt.probe.why;
    eglDestroyContext(handle, attempt.context);
    attempt.context = EGL_NO_CONTEXT;
    attempt.display.reset();
  }
  return attempt;
}

// Devices in the order to try them: hardware before Mesa's software device.
std::vector<EGLDeviceEXT> devicesToTry(std::string* why) {
  EGLint count = 0;
  if (eglQueryDevicesEXT(0, nullptr, &count) == EGL_FALSE || count <= 0) {
    *why = "no EGL devices";
    return {};
  }
  std::vector<EGLDeviceEXT> devices(static_cast<std::size_t>(count));
  if (eglQueryDevicesEXT(count, devices.data(), &count) == EGL_FALSE) {
    *why = "eglQueryDevicesEXT failed (" + lastEglError() + ")";
    return {};
  }
  devices.resize(static_cast<std::size_t>(std::max(count, 0)));
  std::stable_partition(devices.begin(), devices.end(), [](EGLDeviceEXT device) {
    return !hasExtension(eglQueryDeviceStringEXT(device, EGL_EXTENSIONS),
                         "EGL_MESA_device_software");
  });
  return devices;
}

}  // namespace

std::unique_ptr<EglContext> EglContext::createHeadless(Error* error, std::optional<EglPlatform> only) {
  auto failure = [error](const std::string& reasons) -> std::unique_ptr<EglContext> {
    setError(error, std::string(kGLErrorDomain), static_cast<int>(GLErrorCode::ContextUnavailable),
             "No headless OpenGL context could be made. " + reasons +
                 " Install a GPU driver with EGL device support, or Mesa's EGL and DRI "
                 "drivers (libegl-mesa0, libgl1-mesa-dri).");
    return nullptr;
  };
  if (!eglLibraryPresent()) {
    return failure("libEGL.so.1 is not installed.");
  }
  const char* client = eglQueryString(EGL_NO_DISPLAY, EGL_EXTENSIONS);
  if (!hasExtension(client, "EGL_EXT_platform_base")) {
    return failure("EGL lacks EGL_EXT_platform_base, so no platform can be chosen.");
  }

  std::string deviceWhy = "EGL_EXT_platform_device is missing";
  std::string surfacelessWhy = "EGL_MESA_platform_surfaceless is missing";
  if (only == EglPlatform::Surfaceless) {
    deviceWhy = "not tried";
  } else if (only == EglPlatform::Device) {
    surfacelessWhy = "not tried";
  }
  Attempt attempt;
  EglPlatform platform = EglPlatform::Device;
  if (only != EglPlatform::Surfaceless && hasExtension(client, "EGL_EXT_platform_device") &&
      (hasExtension(client, "EGL_EXT_device_enumeration") ||
       hasExtension(client, "EGL_EXT_device_base"))) {
    for (EGLDeviceEXT device : devicesToTry(&deviceWhy)) {
      attempt = tryDisplay(eglGetPlatformDisplayEXT(EGL_PLATFORM_DEVICE_EXT, device, nullptr),
                           EglPlatform::Device, &deviceWhy);
      if (attempt.context != EGL_NO_CONTEXT) {
        break;
      }
    }
  }
  if (attempt.context == EGL_NO_CONTEXT && only != EglPlatform::Device &&
      hasExtension(client, "EGL_MESA_platform_surfaceless")) {
    platform = EglPlatform::Surfaceless;
    attempt = tryDisplay(
        eglGetPlatformDisplayEXT(EGL_PLATFORM_SURFACELESS_MESA, EGL_DEFAULT_DISPLAY, nullptr),
        EglPlatform::Surfaceless, &surfacelessWhy);
  }
  if (attempt.context == EGL_NO_CONTEXT) {
    return failure("EGL device platform: " + deviceWhy + ". Mesa surfaceless platform: " +
                   surfacelessWhy + ".");
  }
  std::unique_ptr<EglContext> context(
      new EglContext(std::move(attempt.display), nullptr, attempt.context));
  context->platform_ = platform;
  context->glVersion_ = attempt.probe.version;
  context->description_ =
      (platform == EglPlatform::Device ? "EGL device: " : "Mesa surfaceless: ") +
      attempt.probe.renderer;
  return context;
}

EglContext::EglContext(std::shared_ptr<Display> display, std::shared_ptr<ShareGroup> group,
                       void* nativeContext)
    : GLContext(std::move(group)), display_(std::move(display)), nativeContext_(nativeContext) {}

EglContext::~EglContext() {
  releaseIfCurrent();
  // A context still current on another thread is destroyed by EGL when that
  // thread lets it go.
  eglDestroyContext(display_->handle, nativeContext_);
}

std::unique_ptr<GLContext> EglContext::createSharedContext(Error* error) {
  std::string why;
  EGLContext native = createNativeContext(*display_, nativeContext_, &why);
  if (native == EGL_NO_CONTEXT) {
    setError(error, std::string(kGLErrorDomain), static_cast<int>(GLErrorCode::ContextUnavailable),
             "Could not make a shared OpenGL context: " + why + ".");
    return nullptr;
  }
  std::unique_ptr<EglContext> context(new EglContext(display_, shareGroup(), native));
  context->platform_ = platform_;
  context->glVersion_ = glVersion_;
  context->description_ = description_;
  return context;
}

bool EglContext::makeCurrentNative(Error* error) {
  eglBindAPI(EGL_OPENGL_API);
  if (eglMakeCurrent(display_->handle, EGL_NO_SURFACE, EGL_NO_SURFACE, nativeContext_) ==
      EGL_FALSE) {
    setError(error, std::string(kGLErrorDomain), static_cast<int>(GLErrorCode::MakeCurrentFailed),
             "Could not make the OpenGL context current: " + lastEglError() + ".");
    return false;
  }
  return true;
}

void EglContext::doneCurrentNative() {
  eglBindAPI(EGL_OPENGL_API);
  eglMakeCurrent(display_->handle, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
}

}  // namespace cloudreel::gl
