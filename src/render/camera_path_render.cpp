#include "render/camera_path_render.h"

#include <fmt/format.h>

#include "camera/camera_path.h"
#include "platform/application_defaults.h"
#include "platform/user_defaults.h"
#include "render/offline_gl_renderer.h"
#include "render/opengl_scene.h"
#include "scene/my_document.h"

namespace cloudreel {

std::optional<CameraPathRenderResult> renderSelectedCameraPath(MyDocument& document,
                                                               const OpenGLScene& viewScene) {
  const auto path = std::dynamic_pointer_cast<CameraPath>(document.selectedLayer());
  if (!path) {
    return std::nullopt;
  }
  CameraPathRenderResult result;
  // The renderer writes where its defaults say; the result names the same.
  result.folder = UserDefaults::standardUserDefaults().stringForKey(kImageSavePathKey);
  result.frames = renderCameraPathOfDocument(*path, document, viewScene.fieldOfView(),
                                             static_cast<float>(viewScene.zNear()),
                                             static_cast<float>(viewScene.zFar()));
  return result;
}

Alert cameraPathRenderAlert(const CameraPathRenderResult& result) {
  if (result.frames <= 0) {
    return Alert{"No frames were rendered",
                 "The camera path has no frames, or no off-screen renderer could be made (the "
                 "log says why).",
                 {}};
  }
  const std::string first = result.pattern.format(0);
  const std::string last = result.pattern.format(result.frames - 1);
  return Alert{
      result.frames == 1 ? std::string("Rendered 1 frame")
                         : fmt::format("Rendered {} frames", result.frames),
      result.frames == 1
          ? fmt::format("The frame is {} in {}.", first, result.folder.string())
          : fmt::format("The frames are {} to {} in {}.", first, last, result.folder.string()),
      {}};
}

}  // namespace cloudreel
