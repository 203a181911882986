#include "camera/rw_trackball.h"

#include <epoxy/gl.h>

#include <cstdint>
#include <string>

#include "geometry/trackball.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/value.h"
#include "render/affine_transform_gl.h"
#include "render/opengl_scene.h"

namespace cloudreel {

namespace {

// A pointer coordinate as the trackball takes it: truncated toward zero, NaN
// as 0, saturating beyond the 64-bit range.
std::int64_t pointerCoordinate(double v) { return saturatingCast<std::int64_t>(v); }

// A turn of 0° is the identity whatever its axis, and is skipped: a new
// trackball, and intermediate outside a drag, hold a zero axis, which some
// drivers would normalise into NaNs.
void glRotateAxisAngle(const AxisAngle& r) {
  if (r[0] != 0.0) {
    glRotated(r[0], r[1], r[2], r[3]);
  }
}

std::string rotateKey(std::size_t i) { return "rotate" + std::to_string(i); }

}  // namespace

std::shared_ptr<Animatable3DObject> RWTrackball::makeBlank() const {
  return std::make_shared<RWTrackball>();
}

void RWTrackball::beginTrackballAtPointForScene(double x, double y, const OpenGLScene& scene) {
  trackballBegin(pointerCoordinate(x), pointerCoordinate(y), 0, 0, scene.width(), scene.height());
}

void RWTrackball::rollToTrackball(double x, double y) {
  trackballRoll(pointerCoordinate(x), pointerCoordinate(y), intermediate_);
}

void RWTrackball::addRotationToTrackball() {
  trackballAddRotation(intermediate_, rotation_);
  intermediate_ = {0.0, 0.0, 0.0, 0.0};
}

void RWTrackball::setOrientation() const {
  glInverseTranslate(*objectToWorld());
  glRotateAxisAngle(intermediate_);
  glRotateAxisAngle(rotation_);
}

std::shared_ptr<AffineTransform> RWTrackball::matrix() const {
  // The angle is in degrees but is handed over unconverted, to be read as
  // radians: every transform taken from a trackball has been made this way,
  // and what was built from those transforms must come out the same.
  return AffineTransform::initWithAxisAngleRotation(rotation_);
}

void RWTrackball::encodeWithCoder(KeyedArchiver& coder) const {
  Camera::encodeWithCoder(coder);
  for (std::size_t i = 0; i < rotation_.size(); ++i) {
    coder.encodeDouble(rotation_[i], rotateKey(i));
  }
}

void RWTrackball::initWithCoder(KeyedUnarchiver& coder) {
  Camera::initWithCoder(coder);
  for (std::size_t i = 0; i < rotation_.size(); ++i) {
    rotation_[i] = coder.decodeDoubleForKey(rotateKey(i));
  }
}

}  // namespace cloudreel
