#pragma once
// A camera path of one stored pose per frame, read from a text file of
// positions and three angles (a frame count, then x y z α β γ a frame, the
// angles in degrees). Everything but the reading is the discrete path's.

#include <filesystem>
#include <memory>
#include <string_view>

#include "camera/discrete_camera_path.h"

namespace cloudreel {

class ZXYCameraPath : public DiscreteCameraPath {
 public:
  ZXYCameraPath() = default;

  // As DiscreteCameraPath::initWithURL, for a position-and-angles file.
  static std::shared_ptr<ZXYCameraPath> initWithURL(const std::filesystem::path& url);
  static std::shared_ptr<ZXYCameraPath> initWithText(std::string_view text);

  std::string_view className() const override { return "ZXYCameraPath"; }

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
};

}  // namespace cloudreel
