#pragma once
// The camera the document's views look through, steered by three Euler
// angles in degrees: its orientation is Rz(bank) · Rx(pitch) · Ry(heading).

#include <array>
#include <memory>

#include "camera/camera.h"

namespace cloudreel {

class SceneCamera : public Camera {
 public:
  SceneCamera() = default;
  static std::shared_ptr<SceneCamera> initWithZDistance(double d);

  std::string_view className() const override { return "SceneCamera"; }
  const PropertyTable& properties() const override;

  // bank, pitch, heading
  const std::array<double, 3>& euler() const { return euler_; }
  float heading() const { return narrowToFloat(euler_[2]); }
  float pitch() const { return narrowToFloat(euler_[1]); }
  float bank() const { return narrowToFloat(euler_[0]); }
  // Each rebuilds inertialToObject from the three angles, which also resets
  // its translation to zero.
  void setHeading(float v);
  void setPitch(float v);
  void setBank(float v);

  // (heading, pitch, bank).
  std::shared_ptr<Vector3> rotate() const;
  // Takes pitch from x, bank from y and heading from z: not the order rotate
  // answers, so setRotate(rotate()) keeps the angles only when all three are
  // equal. Saved scenes depend on this mapping.
  void setRotate(const Vector3& v);

  // After the camera keys: "euler_00".."euler_02" as floats. Decoding does
  // not rebuild the rotation from them: the decoded inertialToObject stands.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;

 private:
  void setEulerSlot(std::size_t slot, std::string_view key, float v);
  void applyEuler();

  std::array<double, 3> euler_{};
};

}  // namespace cloudreel
