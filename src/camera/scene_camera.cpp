#include "camera/scene_camera.h"

#include <fmt/printf.h>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"

namespace cloudreel {

namespace {

constexpr int kSceneEulerType = 11;

std::string eulerKey(int i) { return fmt::sprintf("euler_%02d", i); }

}  // namespace

std::shared_ptr<SceneCamera> SceneCamera::initWithZDistance(double d) {
  auto camera = std::make_shared<SceneCamera>();
  camera->objectToWorld()->setTranslationZ(d);
  return camera;
}

const PropertyTable& SceneCamera::properties() const {
  static const PropertyTable table(
      &Camera::properties(),
      {property<SceneCamera>("heading", &SceneCamera::heading, &SceneCamera::setHeading),
       property<SceneCamera>("pitch", &SceneCamera::pitch, &SceneCamera::setPitch),
       property<SceneCamera>("bank", &SceneCamera::bank, &SceneCamera::setBank)});
  return table;
}

std::shared_ptr<Animatable3DObject> SceneCamera::makeBlank() const {
  return std::make_shared<SceneCamera>();
}

void SceneCamera::applyEuler() {
  inertialToObject()->setEulerRotationType(euler_, kSceneEulerType);
}

void SceneCamera::setEulerSlot(std::size_t slot, std::string_view key, float v) {
  willChangeValueForKey(key);
  euler_[slot] = v;
  applyEuler();
  didChangeValueForKey(key);
  postChangeNotification();
}

void SceneCamera::setHeading(float v) { setEulerSlot(2, "heading", v); }
void SceneCamera::setPitch(float v) { setEulerSlot(1, "pitch", v); }
void SceneCamera::setBank(float v) { setEulerSlot(0, "bank", v); }

std::shared_ptr<Vector3> SceneCamera::rotate() const {
  return Vector3::vectorWithXYZ(euler_[2], euler_[1], euler_[0]);
}

void SceneCamera::setRotate(const Vector3& v) {
  willChangeValueForKey("heading");
  willChangeValueForKey("pitch");
  willChangeValueForKey("bank");
  euler_[1] = v.x();
  euler_[0] = v.y();
  euler_[2] = v.z();
  applyEuler();
  postChangeNotification();
  didChangeValueForKey("heading");
  didChangeValueForKey("pitch");
  didChangeValueForKey("bank");
}

void SceneCamera::encodeWithCoder(KeyedArchiver& coder) const {
  Camera::encodeWithCoder(coder);
  for (int i = 0; i < 3; ++i) {
    coder.encodeFloat(narrowToFloat(euler_[static_cast<std::size_t>(i)]), eulerKey(i));
  }
}

void SceneCamera::initWithCoder(KeyedUnarchiver& coder) {
  Camera::initWithCoder(coder);
  for (int i = 0; i < 3; ++i) {
    euler_[static_cast<std::size_t>(i)] = coder.decodeFloatForKey(eulerKey(i));
  }
}

}  // namespace cloudreel
