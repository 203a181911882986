#include "camera/camera.h"

#include <epoxy/gl.h>

#include <cmath>

#include "platform/application_defaults.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "platform/notification_center.h"
#include "platform/user_defaults.h"
#include "render/affine_transform_gl.h"
#include "render/gl/display_list.h"
#include "render/render_options.h"
#include "timeline/affine_track.h"
#include "timeline/float_value_track.h"

namespace cloudreel {

std::shared_ptr<Camera> Camera::initWithZDistance(double d) {
  auto camera = std::make_shared<Camera>();
  camera->objectToWorld()->setTranslationZ(d);
  return camera;
}

std::shared_ptr<Camera> Camera::initWithMatrixTranslate(const AffineTransform::Matrix& matrix,
                                                        const std::array<double, 3>& translate) {
  auto camera = std::make_shared<Camera>();
  camera->inertialToObject()->setDoubles(matrix);
  camera->objectToWorld()->setTranslation(translate);
  return camera;
}

const PropertyTable& Camera::properties() const {
  static const PropertyTable table(
      &Animatable3DObject::properties(),
      {property<Camera>("selected", &Camera::selected, &Camera::setSelected),
       property<Camera>("aspect", &Camera::aspect, &Camera::setAspect),
       property<Camera>("fieldOfView", &Camera::fieldOfView, &Camera::setFieldOfView),
       property<Camera>("name", &Camera::name, &Camera::setName),
       property<Camera>("zNear", &Camera::zNear, &Camera::setZNear),
       property<Camera>("zFar", &Camera::zFar, &Camera::setZFar),
       property<Camera>("positionX", &Camera::positionX, &Camera::setPositionX),
       property<Camera>("positionY", &Camera::positionY, &Camera::setPositionY),
       property<Camera>("positionZ", &Camera::positionZ, &Camera::setPositionZ)});
  return table;
}

std::shared_ptr<Animatable3DObject> Camera::makeBlank() const { return std::make_shared<Camera>(); }

void Camera::copyInto(Animatable3DObject& target) const {
  Animatable3DObject::copyInto(target);
  static_cast<Camera&>(target).setFieldOfView(fieldOfView_);
}

void Camera::setSelected(bool v) {
  changeValueForKey("selected", selected_, v);
  postNotification(v ? kCameraActivateNotification : kCameraDeactivateNotification);
}

float Camera::fieldOfViewInRadians() const {
  return static_cast<float>(static_cast<double>(fieldOfView_ / 180.0f) * 3.141592653589793);
}

void Camera::setMatrixFromQuaternion(const std::array<double, 4>& q) {
  inertialToObject()->setQuaternionRotation(q);
  postChangeNotification();
}

std::shared_ptr<AffineTransform> Camera::transformation() const {
  auto result = inertialToObject()->copy();
  result->multiplyByMatrix(*objectToWorld());
  return result;
}

std::shared_ptr<Vector3> Camera::translation() const {
  return objectToWorld()->translationAsVector3();
}

std::string Camera::positionAsString() const { return translation()->description(); }

void Camera::setPositionX(double v) {
  willChangeValueForKey("positionX");
  objectToWorld()->setTranslationX(v);
  didChangeValueForKey("positionX");
  postChangeNotification();
}

void Camera::setPositionY(double v) {
  willChangeValueForKey("positionY");
  objectToWorld()->setTranslationY(v);
  didChangeValueForKey("positionY");
  postChangeNotification();
}

void Camera::setPositionZ(double v) {
  willChangeValueForKey("positionZ");
  objectToWorld()->setTranslationZ(v);
  didChangeValueForKey("positionZ");
  postChangeNotification();
}

void Camera::setTranslate(const Vector3& v) {
  willChangeValueForKey("positionX");
  willChangeValueForKey("positionY");
  willChangeValueForKey("positionZ");
  objectToWorld()->setTranslationFromVector3(v);
  didChangeValueForKey("positionX");
  didChangeValueForKey("positionY");
  didChangeValueForKey("positionZ");
}

void Camera::postNotification(std::string_view name) const {
  NotificationCenter::defaultCenter().postNotificationName(std::string(name), this);
}

void Camera::postChangeNotification() const { postNotification(kAttributeChangedNotification); }

void Camera::subscribeToChanges(ChangeSubscriber& subscriber) {
  logf("subscription: %p, %p", static_cast<const void*>(&subscriber),
       static_cast<const void*>(this));
  NotificationCenter::defaultCenter().addObserver(
      subscriber, std::string(kAttributeChangedNotification), this,
      [&subscriber](const Notification& n) { subscriber.observeChange(n); });
}

void Camera::unsubscribeFromChanges(ChangeSubscriber& subscriber) {
  logf("unsubscription: %p, %p", static_cast<const void*>(&subscriber),
       static_cast<const void*>(this));
  NotificationCenter::defaultCenter().removeObserver(subscriber);
}

namespace {

// Multiplies by the transpose of the transform's rotation block alone (its
// translation left out): the inverse of a pure rotation.
void multiplyByInverseRotation(const AffineTransform& t) {
  AffineTransform rotation(t.mx());
  rotation.setTranslation({0.0, 0.0, 0.0});
  glMultTransposeMatrix(rotation);
}

}  // namespace

void Camera::setOrientation() const {
  multiplyByInverseRotation(*animationTransform());
  glInverseTranslate(*animationTransform());
  multiplyByInverseRotation(*inertialToObject());
  glInverseTranslate(*inertialToObject());
  glInverseTranslate(*objectToWorld());
}

void Camera::setTransformation() const {
  glTranslate(*objectToWorld());
  glMultMatrix(*inertialToObject());
  glMultMatrix(*animationTransform());
}

void Camera::drawGLWithOptions(const RenderOptions& options) {
  if (!options.isYes(kRenderOptionEditor)) {
    return;
  }
  setTransformation();
  drawGLWithFrustumLength(2.0f);
  if (selected_) {
    drawGLCameraBodyWithSize(1.0f);
  }
}

void Camera::drawGLWithFrustumLength(float length) const {
  const auto color = colorForDefaultsKey(UserDefaults::standardUserDefaults(),
                                         selected_ ? kSelectedFrustumColorKey : kFrustumColorKey);
  // Lines take their colour unlit. Without a registered colour the frustum
  // is white.
  glDisable(GL_LIGHTING);
  if (color) {
    glColor4f(color->red(), color->green(), color->blue(), color->alpha());
  } else {
    glColor4f(1.0f, 1.0f, 1.0f, 1.0f);
  }
  drawFrustumOfLength(length);
}

void Camera::drawFrustumOfLength(float length) const {
  // An aspect of 0 gives infinite corners (IEEE division), which draws
  // nothing useful but is well defined.
  const float h = std::tan(fieldOfViewInRadians() / 2.0f) * length;
  const float v = h / aspect_;
  glBegin(GL_LINES);
  for (const auto& corner : {std::array<float, 2>{-h, -v}, std::array<float, 2>{h, v},
                             std::array<float, 2>{-h, v}, std::array<float, 2>{h, -v}}) {
    glVertex3f(0.0f, 0.0f, 0.0f);
    glVertex3f(corner[0], corner[1], -length);
  }
  glEnd();
}

namespace {

void drawCameraBody() {
  glColor3f(1.0f, 1.0f, 1.0f);
  // The box: x from -0.3 to 0.3, y from -0.5 to 0.5, z from 0 to 2.
  constexpr float kX = 0.3f, kY = 0.5f, kZ = 2.0f;
  const std::array<std::array<float, 2>, 4> corners{{{-kX, -kY}, {kX, -kY}, {kX, kY}, {-kX, kY}}};
  glBegin(GL_LINES);
  for (std::size_t i = 0; i < 4; ++i) {
    const auto& a = corners[i];
    const auto& b = corners[(i + 1) % 4];
    for (const float z : {0.0f, kZ}) {
      glVertex3f(a[0], a[1], z);
      glVertex3f(b[0], b[1], z);
    }
    glVertex3f(a[0], a[1], 0.0f);
    glVertex3f(a[0], a[1], kZ);
  }
  // The lens: a short pyramid from the front face towards the view.
  constexpr float kLens = 0.15f, kLensDepth = -0.3f;
  for (const auto& c : corners) {
    glVertex3f(c[0] * 0.5f, c[1] * 0.3f, 0.0f);
    glVertex3f(c[0] > 0 ? kLens : -kLens, c[1] > 0 ? kLens : -kLens, kLensDepth);
  }
  glEnd();
}

}  // namespace

void Camera::drawGLCameraBodyWithSize(float size) {
  // One list for every camera, for the life of the process (never freed, so
  // no destructor runs after the contexts have gone at exit).
  static auto* const body = new gl::DisplayList();
  glPushMatrix();
  glScalef(size, size, size);
  body->callOrCompile(drawCameraBody);
  glPopMatrix();
}

void Camera::getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) {
  const ObjectPtr self = weak_from_this().lock();
  tracks.push_back(std::make_shared<AffineTrack>(self, "Transform"));
  tracks.push_back(std::make_shared<FloatValueTrack>(self, "fieldOfView", "Field Of View"));
  tracks.push_back(std::make_shared<FloatValueTrack>(self, "zNear", "Near Z Plane"));
  tracks.push_back(std::make_shared<FloatValueTrack>(self, "zFar", "Far Z Plane"));
}

void Camera::encodeWithCoder(KeyedArchiver& coder) const {
  Animatable3DObject::encodeWithCoder(coder);
  coder.encodeString(name_, "name");
  coder.encodeFloat(fieldOfView_, "fieldOfView");
  coder.encodeFloat(zNear_, "zNear");
  coder.encodeFloat(zFar_, "zFar");
}

void Camera::initWithCoder(KeyedUnarchiver& coder) {
  Animatable3DObject::initWithCoder(coder);
  name_ = coder.decodeStringForKey("name");
  fieldOfView_ = coder.decodeFloatForKey("fieldOfView");
  zNear_ = coder.containsValueForKey("zNear") ? coder.decodeFloatForKey("zNear") : 1.0f;
  zFar_ = coder.containsValueForKey("zFar") ? coder.decodeFloatForKey("zFar") : 30.0f;
  // The aspect is not archived; a decoded camera keeps the default 1 rather
  // than a zero that would divide the frustum's height by nothing.
}

}  // namespace cloudreel
