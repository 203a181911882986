#pragma once
// A layer that yields a camera for each frame, or for each moment of a time
// running from 0 to 1. The kinds differ in where the poses come from (stored
// records, an interpolation, the cameras of an import, a stack of other
// paths); the world-space cameras, the timing and the editor drawing are
// shared here.
//
// Cameras handed out are fresh objects owned by the caller; no camera is
// represented by null.

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "scene/layer.h"

namespace cloudreel {

class Camera;

class CameraPath : public Layer {
 public:
  // The frame rate is the "KTDefaultFPS" default, truncated.
  CameraPath();
  explicit CameraPath(std::int32_t fps);

  std::string_view className() const override { return "CameraPath"; }
  const PropertyTable& properties() const override;

  std::int32_t fps() const { return fps_; }
  virtual std::int32_t nFrames() const { return nFrames_; }
  std::int32_t currentFrame() const { return currentFrame_; }
  // Scales the stored positions of the record-based paths.
  float translateGain() const { return translateGain_; }
  // Stored and archived for the panels; no path computation reads them.
  bool invert() const { return invert_; }
  bool interpolate() const { return interpolate_; }
  bool isDiscreteFrames() const { return false; }
  bool isInfinite() const { return false; }

  void setFps(std::int32_t v) { changeValueForKey("fps", fps_, v); }
  void setNFrames(std::int32_t v) { changeValueForKey("nFrames", nFrames_, v); }
  void setCurrentFrame(std::int32_t v) { changeValueForKey("currentFrame", currentFrame_, v); }
  void setTranslateGain(float v) { changeValueForKey("translateGain", translateGain_, v); }
  void setInvert(bool v) { changeValueForKey("invert", invert_, v); }
  void setInterpolate(bool v) { changeValueForKey("interpolate", interpolate_, v); }

  // A new camera in the path's own space; null where the kind has none.
  virtual std::shared_ptr<Camera> cameraInObjectSpaceForFrame(std::int32_t frame) const = 0;
  virtual std::shared_ptr<Camera> cameraInObjectSpaceForTime(float t) const = 0;
  // The object-space camera with the path's own transforms applied after
  // the camera's: inertialToObject onto inertialToObject, objectToWorld
  // onto objectToWorld.
  std::shared_ptr<Camera> cameraInWorldSpaceForFrame(std::int32_t frame) const;
  std::shared_ptr<Camera> cameraInWorldSpaceForTime(float t) const;

  // currentFrame = nFrames × t, truncated (saturating, a NaN giving 0).
  void setCurrentFrameForTime(float t);
  // nFrames / fps in floats; an fps of 0 gives an infinity or a NaN (IEEE).
  float durationInSeconds() const;
  float duration() const { return durationInSeconds(); }
  std::string durationAsFormattedString() const;
  // "class:name".
  std::string description() const;

  // In editor frames only: every frame's camera drawn in its own saved
  // matrix, the current frame's selected first.
  void drawGLWithOptions(const RenderOptions& options) override;

  // After the layer keys: "nFrames", "translateGain" (32-bit float) and
  // "fps"; an fps of 0 reads as the "KTDefaultFPS" default. currentFrame,
  // invert and interpolate are not archived.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  void copyInto(Animatable3DObject& target) const override;
  // A frame index from nFrames × t computed in single precision, truncated
  // without undefined behaviour.
  static std::int32_t frameForTime(std::int32_t frames, float t);

 private:
  std::int32_t fps_;
  std::int32_t nFrames_ = 0;
  std::int32_t currentFrame_ = 0;
  float translateGain_ = 1.0f;
  bool invert_ = false;
  bool interpolate_ = false;
};

}  // namespace cloudreel
