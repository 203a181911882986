#include "camera/slerp_camera_path.h"

#include "camera/camera.h"
#include "geometry/rotations.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"

namespace cloudreel {

namespace {

std::shared_ptr<Vector3> orZero(std::shared_ptr<Vector3> v) {
  return v ? std::move(v) : Vector3::zeroVector();
}

Quaternion quaternionFromAngles(const Vector3& angles) {
  Quaternion q{};
  eulerToQuaternion(q, angles.x(), angles.y(), angles.z());
  return q;
}

}  // namespace

SLERPCameraPath::SLERPCameraPath() {
  setName("SLERP Path");
  setNFrames(200);
}

const PropertyTable& SLERPCameraPath::properties() const {
  static const PropertyTable table(
      &CameraPath::properties(),
      {property<SLERPCameraPath>("frTranslate", &SLERPCameraPath::frTranslate,
                                 &SLERPCameraPath::setFrTranslate),
       property<SLERPCameraPath>("frRotate", &SLERPCameraPath::frRotate,
                                 &SLERPCameraPath::setFrRotate),
       property<SLERPCameraPath>("toTranslate", &SLERPCameraPath::toTranslate,
                                 &SLERPCameraPath::setToTranslate),
       property<SLERPCameraPath>("toRotate", &SLERPCameraPath::toRotate,
                                 &SLERPCameraPath::setToRotate)});
  return table;
}

void SLERPCameraPath::setFrTranslate(std::shared_ptr<Vector3> v) {
  changeValueForKey("frTranslate", frTranslate_, orZero(std::move(v)));
}
void SLERPCameraPath::setFrRotate(std::shared_ptr<Vector3> v) {
  changeValueForKey("frRotate", frRotate_, orZero(std::move(v)));
}
void SLERPCameraPath::setToTranslate(std::shared_ptr<Vector3> v) {
  changeValueForKey("toTranslate", toTranslate_, orZero(std::move(v)));
}
void SLERPCameraPath::setToRotate(std::shared_ptr<Vector3> v) {
  changeValueForKey("toRotate", toRotate_, orZero(std::move(v)));
}

std::shared_ptr<Camera> SLERPCameraPath::cameraInObjectSpaceForFrame(std::int32_t frame) const {
  const std::int32_t frames = nFrames();
  if (frames <= 1) {
    return cameraInObjectSpaceForTime(0.0f);
  }
  return cameraInObjectSpaceForTime(static_cast<float>(frame) / static_cast<float>(frames - 1));
}

std::shared_ptr<Camera> SLERPCameraPath::cameraInObjectSpaceForTime(float t) const {
  const double s = t;
  const std::array<double, 3> position{
      frTranslate_->x() + (toTranslate_->x() - frTranslate_->x()) * s,
      frTranslate_->y() + (toTranslate_->y() - frTranslate_->y()) * s,
      frTranslate_->z() + (toTranslate_->z() - frTranslate_->z()) * s};
  Quaternion q{};
  slerpQuaternion(quaternionFromAngles(*frRotate_), quaternionFromAngles(*toRotate_), q, s);
  Matrix16 m{};
  quaternionToMatrix(q, m);
  return Camera::initWithMatrixTranslate(m, position);
}

std::shared_ptr<Animatable3DObject> SLERPCameraPath::makeBlank() const {
  return std::make_shared<SLERPCameraPath>();
}

void SLERPCameraPath::copyInto(Animatable3DObject& target) const {
  CameraPath::copyInto(target);
  auto& copy = static_cast<SLERPCameraPath&>(target);
  copy.setFrTranslate(frTranslate_->copy());
  copy.setFrRotate(frRotate_->copy());
  copy.setToTranslate(toTranslate_->copy());
  copy.setToRotate(toRotate_->copy());
}

void SLERPCameraPath::encodeWithCoder(KeyedArchiver& coder) const {
  CameraPath::encodeWithCoder(coder);
  coder.encodeObject(frTranslate_, "frTranslate");
  coder.encodeObject(frRotate_, "frRotate");
  coder.encodeObject(toTranslate_, "toTranslate");
  coder.encodeObject(toRotate_, "toRotate");
}

void SLERPCameraPath::initWithCoder(KeyedUnarchiver& coder) {
  CameraPath::initWithCoder(coder);
  frTranslate_ = orZero(coder.decodeObjectOfClassForKey<Vector3>("frTranslate"));
  frRotate_ = orZero(coder.decodeObjectOfClassForKey<Vector3>("frRotate"));
  toTranslate_ = orZero(coder.decodeObjectOfClassForKey<Vector3>("toTranslate"));
  toRotate_ = orZero(coder.decodeObjectOfClassForKey<Vector3>("toRotate"));
}

}  // namespace cloudreel
