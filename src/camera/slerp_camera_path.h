#pragma once
// A camera path that moves from one pose to another: the position along the
// straight line between the two, the orientation along the shorter great
// arc between them. Each orientation is three angles in degrees, as
// eulerToQuaternion takes them.

#include <cstdint>
#include <memory>
#include <string_view>

#include "camera/camera_path.h"
#include "geometry/vector3.h"

namespace cloudreel {

class SLERPCameraPath : public CameraPath {
 public:
  // Named "SLERP Path", 200 frames, both poses at the origin unturned.
  SLERPCameraPath();

  std::string_view className() const override { return "SLERPCameraPath"; }
  const PropertyTable& properties() const override;

  const std::shared_ptr<Vector3>& frTranslate() const { return frTranslate_; }
  const std::shared_ptr<Vector3>& frRotate() const { return frRotate_; }
  const std::shared_ptr<Vector3>& toTranslate() const { return toTranslate_; }
  const std::shared_ptr<Vector3>& toRotate() const { return toRotate_; }
  // A null vector is stored as (0, 0, 0), so the path always has all four.
  void setFrTranslate(std::shared_ptr<Vector3> v);
  void setFrRotate(std::shared_ptr<Vector3> v);
  void setToTranslate(std::shared_ptr<Vector3> v);
  void setToRotate(std::shared_ptr<Vector3> v);

  // Time frame / (nFrames - 1), so the last frame is the end pose. A path
  // of one frame or none has no span to divide; its frames are the start
  // pose rather than the not-a-number pose the division would give.
  std::shared_ptr<Camera> cameraInObjectSpaceForFrame(std::int32_t frame) const override;
  // The pose at t (not clamped: beyond 0 to 1 it extrapolates);
  // translateGain does not apply.
  std::shared_ptr<Camera> cameraInObjectSpaceForTime(float t) const override;

  // After the path keys: "frTranslate", "frRotate", "toTranslate",
  // "toRotate" as Vector3 objects; a missing one reads as (0, 0, 0).
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  void copyInto(Animatable3DObject& target) const override;

 private:
  std::shared_ptr<Vector3> frTranslate_ = Vector3::zeroVector();
  std::shared_ptr<Vector3> frRotate_ = Vector3::zeroVector();
  std::shared_ptr<Vector3> toTranslate_ = Vector3::zeroVector();
  std::shared_ptr<Vector3> toRotate_ = Vector3::zeroVector();
};

}  // namespace cloudreel
