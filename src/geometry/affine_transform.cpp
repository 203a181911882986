#include "geometry/affine_transform.h"

#include <cmath>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"

namespace cloudreel {
namespace {

constexpr double kPi = 3.141592653589793;

std::shared_ptr<AffineTransform> made(void (AffineTransform::*set)(const std::array<double, 4>&),
                                      const std::array<double, 4>& a) {
  auto t = std::make_shared<AffineTransform>();
  ((*t).*set)(a);
  return t;
}

}  // namespace

std::shared_ptr<AffineTransform> AffineTransform::initWithTranslation(
    const std::array<double, 3>& t) {
  auto result = std::make_shared<AffineTransform>();
  result->setTranslation(t);
  return result;
}

std::shared_ptr<AffineTransform> AffineTransform::initWithTranslationVector(const Vector3& t) {
  auto result = std::make_shared<AffineTransform>();
  result->setTranslationFromVector3(t);
  return result;
}

std::shared_ptr<AffineTransform> AffineTransform::initWithDoubles(const Matrix& m) {
  return std::make_shared<AffineTransform>(m);
}

std::shared_ptr<AffineTransform> AffineTransform::initWithScale(double s) {
  auto result = std::make_shared<AffineTransform>();
  result->setToScale(s);
  return result;
}

std::shared_ptr<AffineTransform> AffineTransform::initWithAxisAngleRotation(
    const std::array<double, 4>& r) {
  return made(&AffineTransform::setAxisAngleRotation, r);
}

std::shared_ptr<AffineTransform> AffineTransform::initWithQuaternion(
    const std::array<double, 4>& q) {
  return made(&AffineTransform::setQuaternionRotation, q);
}

std::shared_ptr<AffineTransform> AffineTransform::initWithEulerType(const std::array<double, 3>& e,
                                                                    int type) {
  auto result = std::make_shared<AffineTransform>();
  result->setEulerRotationType(e, type);
  return result;
}

const PropertyTable& AffineTransform::properties() const {
  static const PropertyTable table(
      &Object::objectProperties(),
      {notifyingProperty<AffineTransform>("scale", &AffineTransform::scale,
                                          &AffineTransform::setScale),
       notifyingProperty<AffineTransform>("translationX", &AffineTransform::translationX,
                                          &AffineTransform::setTranslationX),
       notifyingProperty<AffineTransform>("translationY", &AffineTransform::translationY,
                                          &AffineTransform::setTranslationY),
       notifyingProperty<AffineTransform>("translationZ", &AffineTransform::translationZ,
                                          &AffineTransform::setTranslationZ)});
  return table;
}

std::shared_ptr<AffineTransform> AffineTransform::copy() const {
  return std::make_shared<AffineTransform>(mx_);
}

void AffineTransform::getFloats(std::array<float, 16>& out) const {
  for (std::size_t i = 0; i < 16; ++i) {
    out[i] = narrowToFloat(mx_[i]);
  }
}

void AffineTransform::setTranslation(const std::array<double, 3>& t) {
  mx_[12] = t[0];
  mx_[13] = t[1];
  mx_[14] = t[2];
}

void AffineTransform::getTranslation(std::array<double, 3>& out) const {
  out = {mx_[12], mx_[13], mx_[14]};
}

void AffineTransform::setTranslationFromVector3(const Vector3& t) {
  setTranslation({t.x(), t.y(), t.z()});
}

std::shared_ptr<Vector3> AffineTransform::translationAsVector3() const {
  return std::make_shared<Vector3>(mx_[12], mx_[13], mx_[14]);
}

void AffineTransform::setAxisAngleRotation(const std::array<double, 4>& r) {
  // The axis is used as given, without normalising.
  const auto [angle, ax, ay, az] = r;
  const double s = std::sin(angle);
  const double c = std::cos(angle);
  const double t = 1.0 - c;
  mx_[0] = t * ax * ax + c;
  mx_[1] = t * ax * ay + az * s;
  mx_[2] = t * ax * az - ay * s;
  mx_[4] = t * ax * ay - az * s;
  mx_[5] = t * ay * ay + c;
  mx_[6] = t * ay * az + ax * s;
  mx_[8] = t * ax * az + ay * s;
  mx_[9] = t * ay * az - ax * s;
  mx_[10] = t * az * az + c;
}

void AffineTransform::setQuaternionRotation(const std::array<double, 4>& q) {
  const auto [q0, q1, q2, q3] = q;
  mx_[0] = 1 - 2 * q2 * q2 - 2 * q3 * q3;
  mx_[1] = 2 * q0 * q3 + 2 * q1 * q2;
  // Element 2 keeps the term 2·q0·q1 where the textbook form has -2·q0·q2:
  // saved documents were made with exactly this matrix.
  mx_[2] = 2 * q0 * q1 + 2 * q1 * q3;
  mx_[4] = 2 * q1 * q2 - 2 * q0 * q3;
  mx_[5] = 1 - 2 * q1 * q1 - 2 * q3 * q3;
  mx_[6] = 2 * q0 * q1 + 2 * q2 * q3;
  mx_[8] = 2 * q0 * q2 + 2 * q1 * q3;
  mx_[9] = 2 * q2 * q3 - 2 * q0 * q1;
  mx_[10] = 1 - 2 * q1 * q1 - 2 * q2 * q2;
}

void AffineTransform::setEulerRotationType(const std::array<double, 3>& e, int type) {
  if (type != 11 && type != 0) {
    return;
  }
  const double r = kPi / 180.0;
  const double s0 = std::sin(e[0] * r), c0 = std::cos(e[0] * r);
  const double s1 = std::sin(e[1] * r), c1 = std::cos(e[1] * r);
  const double s2 = std::sin(e[2] * r), c2 = std::cos(e[2] * r);
  Matrix m = kIdentity;
  if (type == 11) {
    m[0] = c0 * c2 - s0 * s1 * s2;
    m[1] = s0 * c2 + c0 * s1 * s2;
    m[2] = -c1 * s2;
    m[4] = -s0 * c1;
    m[5] = c0 * c1;
    m[6] = s1;
    m[8] = c0 * s2 + s0 * s1 * c2;
    m[9] = s0 * s2 - c0 * s1 * c2;
    m[10] = c1 * c2;
  } else {
    m[0] = c1;
    m[1] = c0 * s1;
    m[2] = s0 * s1;
    m[4] = -s1 * c2;
    m[5] = c0 * c1 * c2 - s0 * s2;
    m[6] = s0 * c1 * c2 + c0 * s2;
    m[8] = s1 * s2;
    // s0 rather than c0 in the second product: this element is kept as the
    // system has always computed it.
    m[9] = -s0 * c2 - s0 * c1 * s2;
    m[10] = c0 * c2 - s0 * c1 * s2;
  }
  mx_ = m;
}

void AffineTransform::setToScale(double s) {
  mx_[0] = s;
  mx_[5] = s;
  mx_[10] = s;
}

void AffineTransform::multiplyByMatrix(const AffineTransform& other) {
  // Copies first, so a transform may be multiplied by itself.
  const Matrix a = mx_;
  const Matrix b = other.mx_;
  for (int c = 0; c < 3; ++c) {
    for (int r = 0; r < 3; ++r) {
      mx_[4 * c + r] = b[r] * a[4 * c] + b[4 + r] * a[4 * c + 1] + b[8 + r] * a[4 * c + 2];
    }
  }
  for (int r = 0; r < 3; ++r) {
    mx_[12 + r] = b[r] * a[12] + b[4 + r] * a[13] + b[8 + r] * a[14] + b[12 + r];
  }
  mx_[15] = 1.0;
}

void AffineTransform::multiplyByAxisAngleRotation(const std::array<double, 4>& r) {
  multiplyByMatrix(*initWithAxisAngleRotation(r));
}

void AffineTransform::multiplyByTranslation(const std::array<double, 3>& t) {
  multiplyByMatrix(*initWithTranslation(t));
}

void AffineTransform::multiplyByScale(double s) { multiplyByMatrix(*initWithScale(s)); }

void AffineTransform::multiply3Vector(std::array<double, 3>& p) const {
  const auto [x, y, z] = p;
  p[0] = mx_[0] * x + mx_[4] * y + mx_[8] * z + mx_[12];
  p[1] = mx_[1] * x + mx_[5] * y + mx_[9] * z + mx_[13];
  p[2] = mx_[2] * x + mx_[6] * y + mx_[10] * z + mx_[14];
}

float AffineTransform::determinant() const {
  const Matrix& m = mx_;
  return narrowToFloat(m[0] * (m[5] * m[10] - m[6] * m[9]) + m[1] * (m[6] * m[8] - m[10] * m[4]) +
                       m[2] * (m[9] * m[4] - m[5] * m[8]));
}

float AffineTransform::scale() const { return std::cbrt(determinant()); }

void AffineTransform::setScale(double s) { multiplyByScale(s / static_cast<double>(scale())); }

std::shared_ptr<Vector3> AffineTransform::basisVectorX() const {
  return std::make_shared<Vector3>(mx_[0], mx_[4], mx_[8]);
}
std::shared_ptr<Vector3> AffineTransform::basisVectorY() const {
  return std::make_shared<Vector3>(mx_[1], mx_[5], mx_[9]);
}
std::shared_ptr<Vector3> AffineTransform::basisVectorZ() const {
  return std::make_shared<Vector3>(mx_[2], mx_[6], mx_[10]);
}
std::shared_ptr<Vector3> AffineTransform::columnZ() const {
  return std::make_shared<Vector3>(mx_[8], mx_[9], mx_[10]);
}

void AffineTransform::printMatrix() const {
  logf("Matrix4x4:");
  for (int i = 0; i < 4; ++i) {
    logf("%0.2lf %0.2lf %0.2lf %0.2lf ", mx_[i], mx_[i + 4], mx_[i + 8], mx_[i + 12]);
  }
}

void AffineTransform::sendKVOWillChange() {
  willChangeValueForKey("scale");
  willChangeValueForKey("translationX");
  willChangeValueForKey("translationY");
  willChangeValueForKey("translationZ");
}

void AffineTransform::sendKVODidChange() {
  didChangeValueForKey("scale");
  didChangeValueForKey("translationX");
  didChangeValueForKey("translationY");
  didChangeValueForKey("translationZ");
}

namespace {
std::string elementKey(std::size_t i) { return fmt::sprintf("mx%02d", static_cast<int>(i)); }
}  // namespace

void AffineTransform::encodeWithCoder(KeyedArchiver& coder) const {
  for (std::size_t i = 0; i < 16; ++i) {
    coder.encodeFloat(narrowToFloat(mx_[i]), elementKey(i));
  }
}

void AffineTransform::initWithCoder(KeyedUnarchiver& coder) {
  for (std::size_t i = 0; i < 16; ++i) {
    mx_[i] = coder.decodeFloatForKey(elementKey(i));
  }
}

}  // namespace cloudreel
