#pragma once
// A camera turned by the virtual trackball: a pointer drag over the view
// rolls the scene in front of the camera. The turn of the drag in progress is
// kept apart from the turn accumulated by earlier drags, and folded into it
// when the drag ends.
//
// Both turns are axis-angles with the angle in degrees. A scene point is
// turned by the accumulated rotation, then by the drag's, then shifted by
// minus the camera's position.

#include <memory>

#include "camera/camera.h"
#include "geometry/rotations.h"

namespace cloudreel {

class OpenGLScene;

class RWTrackball : public Camera {
 public:
  // No turn: both axis-angles are all zero.
  RWTrackball() = default;

  std::string_view className() const override { return "RWTrackball"; }

  // The accumulated turn.
  const AxisAngle& rotation() const { return rotation_; }
  // The turn of the drag in progress; all zero outside a drag.
  const AxisAngle& intermediate() const { return intermediate_; }

  // Starts a drag at a pointer position in the view's pixels (y up) over
  // the scene's whole size. Pointer coordinates are truncated toward zero.
  void beginTrackballAtPointForScene(double x, double y, const OpenGLScene& scene);
  // The drag's turn from its start to the pointer becomes intermediate.
  void rollToTrackball(double x, double y);
  // Ends a drag: its turn is folded into rotation and intermediate cleared.
  void addRotationToTrackball();

  // Multiplies the viewing transform onto the current matrix: minus the
  // position of objectToWorld, the drag's turn, then the accumulated turn.
  // The camera's inertialToObject and animationTransform are not used.
  void setOrientation() const override;

  // A transform turning about rotation's axis by its angle read as radians:
  // the degrees are handed over unconverted, as they always have been.
  std::shared_ptr<AffineTransform> matrix() const;

  // After the camera keys: "rotate0".."rotate3", the four doubles of
  // rotation, angle first. The drag in progress is not saved.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  // A copy is a trackball with the camera's copied state and no turn of its
  // own: neither rotation nor intermediate is copied.
  std::shared_ptr<Animatable3DObject> makeBlank() const override;

 private:
  AxisAngle rotation_{};
  AxisAngle intermediate_{};
};

}  // namespace cloudreel
