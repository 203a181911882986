#pragma once
// The cameras of an import as a camera path: frame i looks through camera
// i. In the editor the field shows every camera's frustum and, for cameras
// with a photograph, the photograph at the end of it.

#include <cstdint>
#include <memory>
#include <string_view>
#include <vector>

#include "camera/camera_path.h"

namespace cloudreel {

class CameraField : public CameraPath {
 public:
  // Named "Cameras", with no cameras.
  CameraField();

  std::string_view className() const override { return "CameraField"; }
  const PropertyTable& properties() const override;

  const std::vector<std::shared_ptr<Camera>>& cameras() const { return cameras_; }
  void setCameras(std::vector<std::shared_ptr<Camera>> v);
  // Appends, announced as a change of "cameras".
  void addCamera(std::shared_ptr<Camera> camera);
  bool hasCameras() const override { return true; }
  // The number of cameras.
  std::int32_t nFrames() const override;

  float frustumLength() const { return frustumLength_; }
  float imageOpacity() const { return imageOpacity_; }
  bool drawFrustum() const { return drawFrustum_; }
  bool variableOpacity() const { return variableOpacity_; }
  float variableExponent() const { return variableExponent_; }
  void setFrustumLength(float v) { changeValueForKey("frustumLength", frustumLength_, v); }
  void setImageOpacity(float v) { changeValueForKey("imageOpacity", imageOpacity_, v); }
  void setDrawFrustum(bool v) { changeValueForKey("drawFrustum", drawFrustum_, v); }
  void setVariableOpacity(bool v) { changeValueForKey("variableOpacity", variableOpacity_, v); }
  void setVariableExponent(float v) { changeValueForKey("variableExponent", variableExponent_, v); }

  // A copy of camera `frame`; null for an index outside the list (or a
  // null entry) rather than reading past it.
  std::shared_ptr<Camera> cameraInObjectSpaceForFrame(std::int32_t frame) const override;
  // Frame count × t truncated: t = 1 is one past the last camera, so null.
  std::shared_ptr<Camera> cameraInObjectSpaceForTime(float t) const override;

  // In editor frames only, with depth testing: each camera placed in its
  // own saved matrix, its frustum when drawFrustum is on, and its
  // photograph when it has one. With variableOpacity the photograph's
  // opacity is pow(d × imageOpacity, variableExponent), d the dot product of
  // the camera's viewing axis and the scene camera's: cameras facing away
  // get a negative base, which a fractional exponent turns into a NaN
  // opacity; that is accepted. Without a scene camera in the options the
  // plain imageOpacity is used.
  void drawGLWithOptions(const RenderOptions& options) override;

  // After the path keys: "cameras", the list. The display settings are not
  // archived.
  // The path's tracks, then "Frustum Length" and "Image Opacity".
  void getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) override;
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  // The same cameras (not copies) and the display settings.
  void copyInto(Animatable3DObject& target) const override;

 private:
  std::vector<std::shared_ptr<Camera>> cameras_;
  float frustumLength_ = 2.0f;
  float imageOpacity_ = 1.0f;
  bool drawFrustum_ = true;
  bool variableOpacity_ = false;
  float variableExponent_ = 1.0f;
};

}  // namespace cloudreel
