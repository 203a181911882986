#include "camera/camera_path.h"

#include <epoxy/gl.h>
#include <fmt/printf.h>

#include "camera/camera.h"
#include "platform/application_defaults.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/user_defaults.h"
#include "render/render_options.h"

namespace cloudreel {

namespace {

std::int32_t defaultFps() {
  return saturatingCast<std::int32_t>(
      UserDefaults::standardUserDefaults().floatForKey(kDefaultFPSKey));
}

}  // namespace

CameraPath::CameraPath() : fps_(defaultFps()) {}

CameraPath::CameraPath(std::int32_t fps) : fps_(fps) {}

const PropertyTable& CameraPath::properties() const {
  static const PropertyTable table(
      &Layer::properties(),
      {property<CameraPath>("fps", &CameraPath::fps, &CameraPath::setFps),
       property<CameraPath>("nFrames", &CameraPath::nFrames, &CameraPath::setNFrames),
       property<CameraPath>("currentFrame", &CameraPath::currentFrame,
                            &CameraPath::setCurrentFrame),
       property<CameraPath>("translateGain", &CameraPath::translateGain,
                            &CameraPath::setTranslateGain),
       property<CameraPath>("invert", &CameraPath::invert, &CameraPath::setInvert),
       property<CameraPath>("interpolate", &CameraPath::interpolate, &CameraPath::setInterpolate),
       readOnlyProperty<CameraPath>("isDiscreteFrames", &CameraPath::isDiscreteFrames),
       readOnlyProperty<CameraPath>("isInfinite", &CameraPath::isInfinite),
       readOnlyProperty<CameraPath>("durationInSeconds", &CameraPath::durationInSeconds),
       readOnlyProperty<CameraPath>("duration", &CameraPath::duration),
       readOnlyProperty<CameraPath>("durationAsFormattedString",
                                    &CameraPath::durationAsFormattedString)});
  return table;
}

void CameraPath::copyInto(Animatable3DObject& target) const {
  Layer::copyInto(target);
  auto& copy = static_cast<CameraPath&>(target);
  copy.setFps(fps_);
  copy.setNFrames(nFrames_);
  copy.setTranslateGain(translateGain_);
  copy.setInvert(invert_);
  copy.setInterpolate(interpolate_);
}

std::shared_ptr<Camera> CameraPath::cameraInWorldSpaceForFrame(std::int32_t frame) const {
  auto camera = cameraInObjectSpaceForFrame(frame);
  if (camera) {
    camera->inertialToObject()->multiplyByMatrix(*inertialToObject());
    camera->objectToWorld()->multiplyByMatrix(*objectToWorld());
  }
  return camera;
}

std::shared_ptr<Camera> CameraPath::cameraInWorldSpaceForTime(float t) const {
  auto camera = cameraInObjectSpaceForTime(t);
  if (camera) {
    camera->inertialToObject()->multiplyByMatrix(*inertialToObject());
    camera->objectToWorld()->multiplyByMatrix(*objectToWorld());
  }
  return camera;
}

std::int32_t CameraPath::frameForTime(std::int32_t frames, float t) {
  return saturatingCast<std::int32_t>(static_cast<float>(frames) * t);
}

void CameraPath::setCurrentFrameForTime(float t) { setCurrentFrame(frameForTime(nFrames(), t)); }

float CameraPath::durationInSeconds() const {
  return static_cast<float>(nFrames()) / static_cast<float>(fps_);
}

std::string CameraPath::durationAsFormattedString() const {
  return fmt::sprintf("%0.2f s", durationInSeconds());
}

std::string CameraPath::description() const { return fmt::sprintf("%s:%s", className(), name()); }

void CameraPath::drawGLWithOptions(const RenderOptions& options) {
  if (!options.isYes(kRenderOptionEditor)) {
    return;
  }
  const std::int32_t frames = nFrames();
  for (std::int32_t i = 0; i < frames; ++i) {
    glPushMatrix();
    if (const auto camera = cameraInObjectSpaceForFrame(i)) {
      if (i == currentFrame_) {
        camera->setSelected(true);
      }
      camera->drawGLWithOptions(options);
    }
    glPopMatrix();
  }
}

void CameraPath::encodeWithCoder(KeyedArchiver& coder) const {
  Layer::encodeWithCoder(coder);
  coder.encodeInt32(nFrames(), "nFrames");
  coder.encodeFloat(translateGain_, "translateGain");
  coder.encodeInt32(fps_, "fps");
}

void CameraPath::initWithCoder(KeyedUnarchiver& coder) {
  Layer::initWithCoder(coder);
  nFrames_ = coder.decodeInt32ForKey("nFrames");
  translateGain_ = coder.decodeFloatForKey("translateGain");
  fps_ = coder.decodeInt32ForKey("fps");
  if (fps_ == 0) {
    fps_ = defaultFps();
  }
}

}  // namespace cloudreel
