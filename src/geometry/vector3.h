#pragma once
// An observable three-component vector of doubles, and the tolerance
// comparison its equality uses.

#include <array>
#include <memory>
#include <string>

#include "platform/object.h"

namespace cloudreel {

struct Notification;

// Equal within a relative tolerance: exact equality, else (when either value
// is zero, where a relative test is meaningless) |a - b| < epsilon², else
// |a - b| / (|a| + |b|) < epsilon.
bool nearlyEqual(double a, double b, double epsilon);

// Someone told of every change of a vector through "KTAttributeChanged".
class ChangeSubscriber : public Observer {
 public:
  virtual void observeChange(const Notification& notification) = 0;
};

class Vector3 : public Object {
 public:
  // The tolerance of isEqual: 20 single-precision epsilons.
  static constexpr double kEqualityEpsilon = 20.0 * 1.1920928955078125e-7;

  Vector3() = default;
  Vector3(double x, double y, double z) : x_(x), y_(y), z_(z) {}
  explicit Vector3(const std::array<double, 3>& xyz) : x_(xyz[0]), y_(xyz[1]), z_(xyz[2]) {}

  static std::shared_ptr<Vector3> zeroVector() { return std::make_shared<Vector3>(); }
  static std::shared_ptr<Vector3> vectorWithXYZ(double x, double y, double z) {
    return std::make_shared<Vector3>(x, y, z);
  }
  static std::shared_ptr<Vector3> vectorWithFloats(const std::array<double, 3>& xyz) {
    return std::make_shared<Vector3>(xyz);
  }

  std::string_view className() const override { return "Vector3"; }
  const PropertyTable& properties() const override;

  double x() const { return x_; }
  double y() const { return y_; }
  double z() const { return z_; }
  // Each setter notifies observers of its key, then posts "KTAttributeChanged".
  void setX(double v);
  void setY(double v);
  void setZ(double v);
  void setXYZ(double x, double y, double z);
  void addXYZ(double x, double y, double z);
  void addFloats(const std::array<double, 3>& xyz) { addXYZ(xyz[0], xyz[1], xyz[2]); }
  // Despite the name, a getter: writes the components into the caller's array.
  void setDoubles(std::array<double, 3>& out) const { out = {x_, y_, z_}; }

  // In-place arithmetic, silent: callers that need a notice post one.
  void negate();
  void multiplyByScalar(float s);
  // Vectors shorter than 1e-6 become (0, 0, 1).
  void normalize();

  float magnitude() const;
  float dotProduct(const Vector3& o) const;
  std::shared_ptr<Vector3> crossProduct(const Vector3& o) const;
  // Component-wise nearlyEqual with kEqualityEpsilon.
  bool isEqual(const Vector3& o) const;
  std::shared_ptr<Vector3> copy() const;
  std::string description() const;

  void postChangeNotification();
  void subscribeToChanges(ChangeSubscriber& subscriber);
  // Removes the subscriber from every notification, not only this vector's.
  static void unsubscribeFromChanges(ChangeSubscriber& subscriber);

  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 private:
  double x_ = 0.0;
  double y_ = 0.0;
  double z_ = 0.0;
};

}  // namespace cloudreel
