#include "geometry/vector3.h"

#include <fmt/format.h>

#include <cmath>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/notification_center.h"

namespace cloudreel {

bool nearlyEqual(double a, double b, double epsilon) {
  if (a == b) {
    return true;
  }
  const double difference = std::fabs(a - b);
  if (a * b == 0.0) {
    return difference < epsilon * epsilon;
  }
  return difference / (std::fabs(a) + std::fabs(b)) < epsilon;
}

const PropertyTable& Vector3::properties() const {
  static const PropertyTable table(&Object::objectProperties(),
                                   {property<Vector3>("x", &Vector3::x, &Vector3::setX),
                                    property<Vector3>("y", &Vector3::y, &Vector3::setY),
                                    property<Vector3>("z", &Vector3::z, &Vector3::setZ)});
  return table;
}

void Vector3::setX(double v) {
  changeValueForKey("x", x_, v);
  postChangeNotification();
}

void Vector3::setY(double v) {
  changeValueForKey("y", y_, v);
  postChangeNotification();
}

void Vector3::setZ(double v) {
  changeValueForKey("z", z_, v);
  postChangeNotification();
}

void Vector3::setXYZ(double x, double y, double z) {
  willChangeValueForKey("x");
  willChangeValueForKey("y");
  willChangeValueForKey("z");
  x_ = x;
  y_ = y;
  z_ = z;
  didChangeValueForKey("x");
  didChangeValueForKey("y");
  didChangeValueForKey("z");
  postChangeNotification();
}

void Vector3::addXYZ(double x, double y, double z) { setXYZ(x_ + x, y_ + y, z_ + z); }

void Vector3::negate() {
  // Flips the sign bit, so 0 becomes -0.
  x_ = -x_;
  y_ = -y_;
  z_ = -z_;
}

void Vector3::multiplyByScalar(float s) {
  const double d = s;
  x_ *= d;
  y_ *= d;
  z_ *= d;
}

float Vector3::magnitude() const {
  return narrowToFloat(std::sqrt(x_ * x_ + y_ * y_ + z_ * z_));
}

void Vector3::normalize() {
  const float m = magnitude();
  if (m > 1e-6f) {
    x_ /= m;
    y_ /= m;
    z_ /= m;
  } else {
    x_ = 0.0;
    y_ = 0.0;
    z_ = 1.0;
  }
}

float Vector3::dotProduct(const Vector3& o) const {
  return narrowToFloat(x_ * o.x_ + y_ * o.y_ + z_ * o.z_);
}

std::shared_ptr<Vector3> Vector3::crossProduct(const Vector3& o) const {
  return std::make_shared<Vector3>(y_ * o.z_ - z_ * o.y_, z_ * o.x_ - x_ * o.z_,
                                   x_ * o.y_ - y_ * o.x_);
}

bool Vector3::isEqual(const Vector3& o) const {
  return nearlyEqual(x_, o.x_, kEqualityEpsilon) && nearlyEqual(y_, o.y_, kEqualityEpsilon) &&
         nearlyEqual(z_, o.z_, kEqualityEpsilon);
}

std::shared_ptr<Vector3> Vector3::copy() const {
  auto result = std::make_shared<Vector3>();
  result->setX(x_);
  result->setY(y_);
  result->setZ(z_);
  return result;
}

std::string Vector3::description() const {
  return fmt::format("Vector3: <{:.2f}, {:.2f}, {:.2f}>", x_, y_, z_);
}

void Vector3::postChangeNotification() {
  NotificationCenter::defaultCenter().postNotificationName("KTAttributeChanged", this);
}

void Vector3::subscribeToChanges(ChangeSubscriber& subscriber) {
  NotificationCenter::defaultCenter().addObserver(
      subscriber, "KTAttributeChanged", this,
      [&subscriber](const Notification& n) { subscriber.observeChange(n); });
}

void Vector3::unsubscribeFromChanges(ChangeSubscriber& subscriber) {
  NotificationCenter::defaultCenter().removeObserver(subscriber);
}

void Vector3::encodeWithCoder(KeyedArchiver& coder) const {
  coder.encodeDouble(x_, "x");
  coder.encodeDouble(y_, "y");
  coder.encodeDouble(z_, "z");
}

void Vector3::initWithCoder(KeyedUnarchiver& coder) {
  x_ = coder.decodeDoubleForKey("x");
  y_ = coder.decodeDoubleForKey("y");
  z_ = coder.decodeDoubleForKey("z");
}

}  // namespace cloudreel
