#include "camera/camera_field.h"

#include <epoxy/gl.h>

#include <cmath>
#include <limits>

#include "camera/camera.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "render/render_options.h"
#include "timeline/float_value_track.h"

namespace cloudreel {

CameraField::CameraField() { setName("Cameras"); }

const PropertyTable& CameraField::properties() const {
  static const PropertyTable table(
      &CameraPath::properties(),
      {property<CameraField>("frustumLength", &CameraField::frustumLength,
                             &CameraField::setFrustumLength),
       property<CameraField>("imageOpacity", &CameraField::imageOpacity,
                             &CameraField::setImageOpacity),
       property<CameraField>("drawFrustum", &CameraField::drawFrustum,
                             &CameraField::setDrawFrustum),
       property<CameraField>("variableOpacity", &CameraField::variableOpacity,
                             &CameraField::setVariableOpacity),
       property<CameraField>("variableExponent", &CameraField::variableExponent,
                             &CameraField::setVariableExponent),
       readOnlyProperty<CameraField>("hasCameras", &CameraField::hasCameras)});
  return table;
}

void CameraField::setCameras(std::vector<std::shared_ptr<Camera>> v) {
  changeValueForKey("cameras", cameras_, std::move(v));
}

void CameraField::addCamera(std::shared_ptr<Camera> camera) {
  willChangeValueForKey("cameras");
  cameras_.push_back(std::move(camera));
  didChangeValueForKey("cameras");
}

std::int32_t CameraField::nFrames() const {
  return static_cast<std::int32_t>(
      std::min<std::size_t>(cameras_.size(), std::numeric_limits<std::int32_t>::max()));
}

std::shared_ptr<Camera> CameraField::cameraInObjectSpaceForFrame(std::int32_t frame) const {
  if (frame < 0 || static_cast<std::size_t>(frame) >= cameras_.size() ||
      !cameras_[static_cast<std::size_t>(frame)]) {
    return nullptr;
  }
  return copyOf(*cameras_[static_cast<std::size_t>(frame)]);
}

std::shared_ptr<Camera> CameraField::cameraInObjectSpaceForTime(float t) const {
  return cameraInObjectSpaceForFrame(frameForTime(nFrames(), t));
}

void CameraField::drawGLWithOptions(const RenderOptions& options) {
  if (!options.isYes(kRenderOptionEditor)) {
    return;
  }
  const auto viewer = options.sceneCamera();
  glEnable(GL_DEPTH_TEST);
  // A copy of the list: drawing may not change it under the loop.
  const std::vector<std::shared_ptr<Camera>> cameras = cameras_;
  for (const auto& camera : cameras) {
    if (!camera) {
      continue;
    }
    glPushMatrix();
    camera->setTransformation();
    if (drawFrustum_) {
      camera->drawGLWithFrustumLength(frustumLength_);
    }
    if (camera->canDrawImage()) {
      float opacity = imageOpacity_;
      if (variableOpacity_ && viewer) {
        const float d = camera->inertialToObject()->columnZ()->dotProduct(
            *viewer->inertialToObject()->columnZ());
        opacity = std::pow(d * imageOpacity_, variableExponent_);
      }
      camera->drawImageWithFrustumLength(frustumLength_, opacity);
    }
    glPopMatrix();
  }
  glDisable(GL_DEPTH_TEST);
}

std::shared_ptr<Animatable3DObject> CameraField::makeBlank() const {
  return std::make_shared<CameraField>();
}

void CameraField::copyInto(Animatable3DObject& target) const {
  CameraPath::copyInto(target);
  auto& copy = static_cast<CameraField&>(target);
  copy.setCameras(cameras_);
  copy.setFrustumLength(frustumLength_);
  copy.setImageOpacity(imageOpacity_);
  copy.setDrawFrustum(drawFrustum_);
  copy.setVariableOpacity(variableOpacity_);
  copy.setVariableExponent(variableExponent_);
}

void CameraField::getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) {
  CameraPath::getAnimatablePropsInArray(tracks);
  const ObjectPtr self = weak_from_this().lock();
  tracks.push_back(std::make_shared<FloatValueTrack>(self, "frustumLength", "Frustum Length"));
  tracks.push_back(std::make_shared<FloatValueTrack>(self, "imageOpacity", "Image Opacity"));
}

void CameraField::encodeWithCoder(KeyedArchiver& coder) const {
  CameraPath::encodeWithCoder(coder);
  coder.encodeList(cameras_, "cameras");
}

void CameraField::initWithCoder(KeyedUnarchiver& coder) {
  CameraPath::initWithCoder(coder);
  // A missing list reads as an empty one.
  cameras_ = coder.decodeListOfClassForKey<Camera>("cameras").value_or(
      std::vector<std::shared_ptr<Camera>>{});
}

}  // namespace cloudreel
