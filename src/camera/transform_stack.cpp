#include "camera/transform_stack.h"

#include <array>
#include <utility>

#include "camera/camera.h"
#include "geometry/affine_transform.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"

namespace cloudreel {

namespace {

// Marks the stack busy for the duration of a walk over its members.
class BusyScope {
 public:
  explicit BusyScope(bool& busy) : busy_(busy) { busy_ = true; }
  ~BusyScope() { busy_ = false; }
  BusyScope(const BusyScope&) = delete;
  BusyScope& operator=(const BusyScope&) = delete;

 private:
  bool& busy_;
};

}  // namespace

// --- TransformStackMember

std::shared_ptr<TransformStackMember> TransformStackMember::initWithCameraPath(
    std::shared_ptr<CameraPath> path) {
  auto member = std::make_shared<TransformStackMember>();
  if (path) {
    member->name_ = path->name();
  }
  member->path_ = std::move(path);
  return member;
}

const PropertyTable& TransformStackMember::properties() const {
  using M = TransformStackMember;
  static const PropertyTable table(
      &Object::objectProperties(),
      {notifyingProperty<M>("path", &M::path, &M::setPath),
       notifyingProperty<M>("name", &M::name, &M::setName),
       notifyingProperty<M>("translationGain", &M::translationGain, &M::setTranslationGain),
       notifyingProperty<M>("invertRotation", &M::invertRotation, &M::setInvertRotation),
       notifyingProperty<M>("invertTranslation", &M::invertTranslation, &M::setInvertTranslation),
       notifyingProperty<M>("enableRotation", &M::enableRotation, &M::setEnableRotation),
       notifyingProperty<M>("enableTranslation", &M::enableTranslation, &M::setEnableTranslation)});
  return table;
}

void TransformStackMember::applyTransformationToForFrame(AffineTransform& target,
                                                         std::int32_t frame) const {
  const auto camera = path_ ? path_->cameraInWorldSpaceForFrame(frame) : nullptr;
  if (!camera) {
    return;
  }
  AffineTransform m;
  if (enableRotation_) {
    m.multiplyByMatrix(*camera->inertialToObject());
  }
  if (enableTranslation_) {
    std::array<double, 3> t{};
    camera->objectToWorld()->getTranslation(t);
    const double gain = translationGain_;
    for (double& component : t) {
      component = (invertTranslation_ ? -component : component) * gain;
    }
    m.setTranslation(t);
  }
  target.multiplyByMatrix(m);
}

void TransformStackMember::encodeWithCoder(KeyedArchiver& coder) const {
  coder.encodeObject(path_, "path");
  coder.encodeFloat(translationGain_, "translationGain");
  coder.encodeBool(invertRotation_, "invertRotation");
  coder.encodeBool(invertTranslation_, "invertTranslation");
  coder.encodeBool(enableRotation_, "enableRotation");
  coder.encodeBool(enableTranslation_, "enableTranslation");
}

void TransformStackMember::initWithCoder(KeyedUnarchiver& coder) {
  path_ = coder.decodeObjectOfClassForKey<CameraPath>("path");
  translationGain_ = coder.decodeFloatForKey("translationGain");
  invertRotation_ = coder.decodeBoolForKey("invertRotation");
  invertTranslation_ = coder.decodeBoolForKey("invertTranslation");
  enableRotation_ = coder.decodeBoolForKey("enableRotation");
  enableTranslation_ = coder.decodeBoolForKey("enableTranslation");
}

// --- TransformStack

TransformStack::TransformStack() { setName("New stack"); }

void TransformStack::setTransformations(std::vector<std::shared_ptr<TransformStackMember>> v) {
  changeValueForKey("transformations", transformations_, std::move(v));
}

void TransformStack::addTransformation(std::shared_ptr<TransformStackMember> member) {
  willChangeValueForKey("transformations");
  transformations_.push_back(std::move(member));
  didChangeValueForKey("transformations");
}

void TransformStack::moveItemUp(std::int32_t i) {
  if (i < 1 || static_cast<std::size_t>(i) >= transformations_.size()) {
    return;
  }
  const auto index = static_cast<std::size_t>(i);
  willChangeValueForKey("transformations");
  std::swap(transformations_[index - 1], transformations_[index]);
  didChangeValueForKey("transformations");
}

void TransformStack::moveItemDown(std::int32_t i) {
  if (i < 0 || static_cast<std::size_t>(i) + 1 >= transformations_.size()) {
    return;
  }
  const auto index = static_cast<std::size_t>(i);
  willChangeValueForKey("transformations");
  std::swap(transformations_[index], transformations_[index + 1]);
  didChangeValueForKey("transformations");
}

std::int32_t TransformStack::nFrames() const {
  if (busy_) {
    return 0;
  }
  const BusyScope busy(busy_);
  std::int32_t most = 0;
  for (const auto& member : transformations_) {
    if (member && member->path() && member->path()->nFrames() > most) {
      most = member->path()->nFrames();
    }
  }
  return most;
}

std::shared_ptr<Camera> TransformStack::cameraInObjectSpaceForFrame(std::int32_t frame) const {
  auto camera = std::make_shared<Camera>();
  if (busy_) {
    return camera;
  }
  const BusyScope busy(busy_);
  // A copy of the list: a member's path may reach back into this stack.
  const auto members = transformations_;
  for (const auto& member : members) {
    if (member) {
      member->applyTransformationToForFrame(*camera->inertialToObject(), frame);
    }
  }
  return camera;
}

std::shared_ptr<Camera> TransformStack::cameraInObjectSpaceForTime(float t) const {
  return cameraInObjectSpaceForFrame(frameForTime(nFrames(), t));
}

std::shared_ptr<Animatable3DObject> TransformStack::makeBlank() const {
  return std::make_shared<TransformStack>();
}

void TransformStack::copyInto(Animatable3DObject& target) const {
  CameraPath::copyInto(target);
  static_cast<TransformStack&>(target).setTransformations(transformations_);
}

void TransformStack::encodeWithCoder(KeyedArchiver& coder) const {
  CameraPath::encodeWithCoder(coder);
  coder.encodeList(transformations_, "transformations");
}

void TransformStack::initWithCoder(KeyedUnarchiver& coder) {
  CameraPath::initWithCoder(coder);
  transformations_ = coder.decodeListOfClassForKey<TransformStackMember>("transformations")
                         .value_or(std::vector<std::shared_ptr<TransformStackMember>>{});
}

}  // namespace cloudreel
