#pragma once
// The render command of a camera path, as the Layer menu and the view
// controls offer it: the document's selected layer, when it is a camera
// path, rendered frame by frame through the path's cameras into the image
// folder of the user defaults, and what the user is told afterwards.

#include <filesystem>
#include <optional>

#include "platform/user_interaction.h"
#include "render/frame_pattern.h"

namespace cloudreel {

class MyDocument;
class OpenGLScene;

struct CameraPathRenderResult {
  // Frames written (none when no renderer could be made or the path is
  // empty).
  int frames = 0;
  std::filesystem::path folder;
  FramePattern pattern;
};

// Renders the selected camera path at 720 × 480 with the field of view and
// the near and far planes of the view's scene, into the user default
// KTImageSavePath as "out_%04d.tiff", on the calling thread. Nothing when
// the selected layer is not a camera path.
std::optional<CameraPathRenderResult> renderSelectedCameraPath(MyDocument& document,
                                                               const OpenGLScene& viewScene);

// How many frames were written, where and under which names; or that none
// were, and why that may be.
Alert cameraPathRenderAlert(const CameraPathRenderResult& result);

}  // namespace cloudreel
