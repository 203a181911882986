#pragma once
// The viewpoint object: a placed, animatable object with a field of view,
// near and far planes and a name. The view looks through one camera at a
// time, camera paths make one per frame, and imported cameras carry their
// photographs. In the editor a camera shows as a frustum and, when
// selected, a small wireframe body.
//
// The camera stands at the translation of objectToWorld, looking down its
// own -z; its orientation is the rotation of inertialToObject, and
// animationTransform holds what the timeline adds.

#include <array>
#include <memory>
#include <string>
#include <string_view>

#include "geometry/vector3.h"
#include "scene/animatable_3d_object.h"

namespace cloudreel {

class RenderOptions;

inline constexpr std::string_view kCameraActivateNotification =
    "KTPointDocument_CameraActivateNotification";
inline constexpr std::string_view kCameraDeactivateNotification =
    "KTPointDocument_CameraDeactivateNotification";
inline constexpr std::string_view kAttributeChangedNotification = "KTAttributeChanged";

class Camera : public Animatable3DObject {
 public:
  // At the origin, field of view 30°, near 1, far 30, aspect 1, "Camera".
  Camera() = default;
  // d units along +z, looking towards the origin.
  static std::shared_ptr<Camera> initWithZDistance(double d);
  // `matrix` becomes inertialToObject, `translate` the translation of
  // objectToWorld.
  static std::shared_ptr<Camera> initWithMatrixTranslate(const AffineTransform::Matrix& matrix,
                                                         const std::array<double, 3>& translate);

  std::string_view className() const override { return "Camera"; }
  const PropertyTable& properties() const override;

  bool selected() const { return selected_; }
  float aspect() const { return aspect_; }            // width over height
  // Degrees. Virtual because a source camera derives it from its photograph.
  virtual float fieldOfView() const { return fieldOfView_; }
  const std::string& name() const { return name_; }
  float zNear() const { return zNear_; }
  float zFar() const { return zFar_; }

  // Posts the activate notification when selected, the deactivate one
  // otherwise.
  void setSelected(bool v);
  void setAspect(float v) { changeValueForKey("aspect", aspect_, v); }
  void setFieldOfView(float v) { changeValueForKey("fieldOfView", fieldOfView_, v); }
  void setName(std::string v) { changeValueForKey("name", name_, std::move(v)); }
  void setZNear(float v) { changeValueForKey("zNear", zNear_, v); }
  void setZFar(float v) { changeValueForKey("zFar", zFar_, v); }

  // The field of view in radians, computed in single precision.
  virtual float fieldOfViewInRadians() const;
  // The camera's index in its source file; 0 for a camera of no file.
  virtual int number() const { return 0; }

  // Whether the camera has a photograph to show at the end of its frustum
  // (drawImageWithFrustumLength); camera paths ask before drawing one.
  virtual bool canDrawImage() const { return false; }
  // Draws the camera's photograph `length` along its view at `opacity`;
  // nothing for a camera without one.
  virtual void drawImageWithFrustumLength(float length, float opacity) {
    (void)length;
    (void)opacity;
  }

  // Sets the rotation of inertialToObject from {scalar, x, y, z}.
  void setMatrixFromQuaternion(const std::array<double, 4>& q);
  // A new transform: orientation first, then placement.
  std::shared_ptr<AffineTransform> transformation() const;

  // The position (the translation of objectToWorld).
  std::shared_ptr<Vector3> translation() const;
  std::shared_ptr<Vector3> translate() const { return translation(); }
  std::string positionAsString() const;
  float positionX() const { return objectToWorld()->translationX(); }
  float positionY() const { return objectToWorld()->translationY(); }
  float positionZ() const { return objectToWorld()->translationZ(); }
  void setPositionX(double v);
  void setPositionY(double v);
  void setPositionZ(double v);
  void setTranslate(const Vector3& v);

  void postNotification(std::string_view name) const;
  // "KTAttributeChanged" with this camera as object.
  void postChangeNotification() const;
  void subscribeToChanges(ChangeSubscriber& subscriber);
  // Removes the subscriber from every notification, not only this camera's.
  void unsubscribeFromChanges(ChangeSubscriber& subscriber);

  // Multiplies the viewing transform onto the current matrix: the inverse
  // of the camera's placement for rigid transforms (the transposed rotation
  // and negated translation of animationTransform, then of
  // inertialToObject, then the negated position; the rotation of
  // objectToWorld is not used).
  virtual void setOrientation() const;
  // Multiplies the camera's placement onto the current matrix: position,
  // then inertialToObject, then animationTransform.
  void setTransformation() const;

  // In editor frames only: the placement (onto the caller's matrix, which
  // the caller saves), the frustum, and the body when selected.
  virtual void drawGLWithOptions(const RenderOptions& options);
  // The frustum in the colour the user defaults give a selected or an
  // unselected camera.
  void drawGLWithFrustumLength(float length) const;
  // Four lines from the camera to the corners of the image at `length`.
  void drawFrustumOfLength(float length) const;
  // A white wireframe body, `size` times a box from (-0.3, -0.5, 0) to
  // (0.3, 0.5, 2), from a display list shared by all cameras.
  static void drawGLCameraBodyWithSize(float size);

  // After the base keys: "name", "fieldOfView", "zNear", "zFar". A missing
  // "zNear" reads as 1 and a missing "zFar" as 30.
  // A "Transform" track, then "Field Of View", "Near Z Plane" and "Far Z
  // Plane".
  void getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) override;
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  // The base copy and the field of view; near, far, aspect and name stay
  // as a new camera has them.
  void copyInto(Animatable3DObject& target) const override;

 private:
  bool selected_ = false;
  float aspect_ = 1.0f;
  float fieldOfView_ = 30.0f;
  std::string name_ = "Camera";
  float zNear_ = 1.0f;
  float zFar_ = 30.0f;
};

}  // namespace cloudreel
