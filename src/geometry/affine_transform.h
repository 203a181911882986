#pragma once
// A 4×4 transform of doubles, stored column-major as the OpenGL matrix stack
// takes it: row r, column c is mx[4c + r], the translation is mx[12..14].
// Points are column vectors (p maps to M·p); rotations are right-handed.
//
// The transform sends no change notices by itself: its owner brackets a
// change with sendKVOWillChange / sendKVODidChange, which announce the keys
// "scale", "translationX", "translationY" and "translationZ". A set of one of
// those keys by key-value coding is announced, as any observable property's.

#include <array>
#include <memory>

#include "geometry/vector3.h"
#include "platform/object.h"

namespace cloudreel {

class MyDocument;

class AffineTransform : public Object {
 public:
  using Matrix = std::array<double, 16>;

  AffineTransform() = default;  // identity
  explicit AffineTransform(const Matrix& m) { setDoubles(m); }

  static std::shared_ptr<AffineTransform> initWithTranslation(const std::array<double, 3>& t);
  static std::shared_ptr<AffineTransform> initWithTranslationVector(const Vector3& t);
  static std::shared_ptr<AffineTransform> initWithDoubles(const Matrix& m);
  static std::shared_ptr<AffineTransform> initWithScale(double s);
  // {angle in radians, axis x, y, z}
  static std::shared_ptr<AffineTransform> initWithAxisAngleRotation(const std::array<double, 4>& r);
  // {scalar, x, y, z}
  static std::shared_ptr<AffineTransform> initWithQuaternion(const std::array<double, 4>& q);
  // Angles in degrees; see setEulerRotationType.
  static std::shared_ptr<AffineTransform> initWithEulerType(const std::array<double, 3>& e, int type);
  static std::shared_ptr<AffineTransform> axisAngleRotation(const std::array<double, 4>& r) {
    return initWithAxisAngleRotation(r);
  }

  std::string_view className() const override { return "AffineTransform"; }
  const PropertyTable& properties() const override;

  // A deep copy of the sixteen elements; the document is not copied.
  std::shared_ptr<AffineTransform> copy() const;

  const Matrix& mx() const { return mx_; }
  void setDoubles(const Matrix& m) { mx_ = m; }
  void getDoubles(Matrix& out) const { out = mx_; }
  void getFloats(std::array<float, 16>& out) const;

  void setTranslation(const std::array<double, 3>& t);
  void getTranslation(std::array<double, 3>& out) const;
  void setTranslationFromVector3(const Vector3& t);
  std::shared_ptr<Vector3> translationAsVector3() const;
  float translationX() const { return narrowToFloat(mx_[12]); }
  float translationY() const { return narrowToFloat(mx_[13]); }
  float translationZ() const { return narrowToFloat(mx_[14]); }
  // Silent: callers bracket them with sendKVOWillChange / sendKVODidChange.
  void setTranslationX(double v) { mx_[12] = v; }
  void setTranslationY(double v) { mx_[13] = v; }
  void setTranslationZ(double v) { mx_[14] = v; }

  // The rotation setters write the rotation block only.
  void setAxisAngleRotation(const std::array<double, 4>& r);
  void setQuaternionRotation(const std::array<double, 4>& q);
  // Rewrites the whole matrix for type 11 (Rz(e0)·Rx(e1)·Ry(e2)) and type 0
  // (Rx(e0)·Rz(e1)·Rx(e2)), angles in degrees, translation reset to zero;
  // any other type changes nothing.
  void setEulerRotationType(const std::array<double, 3>& e, int type);
  // Sets the diagonal of the block to s; nothing else changes.
  void setToScale(double s);
  // The identity (the name is part of the system's vocabulary).
  void setIdentidy() { mx_ = kIdentity; }

  // Replaces this transform A by B·A: the argument applies after the receiver.
  void multiplyByMatrix(const AffineTransform& b);
  void multiplyByAxisAngleRotation(const std::array<double, 4>& r);
  void multiplyByTranslation(const std::array<double, 3>& t);
  void multiplyByScale(double s);
  // Transforms a point in place, ignoring the bottom row.
  void multiply3Vector(std::array<double, 3>& p) const;

  // Of the upper-left 3×3 block.
  float determinant() const;
  // Cube root of the determinant, negative for a mirroring transform.
  float scale() const;
  // Scales the whole transform so that scale() becomes s. A singular block
  // has scale 0, and the division then gives infinities or NaNs, as the
  // transform has always done; the arithmetic is IEEE and well defined.
  void setScale(double s);

  // The rows of the rotation block, and its third column.
  std::shared_ptr<Vector3> basisVectorX() const;
  std::shared_ptr<Vector3> basisVectorY() const;
  std::shared_ptr<Vector3> basisVectorZ() const;
  std::shared_ptr<Vector3> columnZ() const;

  void printMatrix() const;

  void sendKVOWillChange();
  void sendKVODidChange();

  MyDocument* document() const { return document_; }
  void addObserversForDocument(MyDocument* document) { document_ = document; }
  void removeObserversForDocument(MyDocument*) {}

  // Written as sixteen 32-bit floats "mx00".."mx15": a decoded transform
  // equals the saved one only to float precision, by design.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

  static constexpr Matrix kIdentity = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1};

 private:
  Matrix mx_ = kIdentity;
  MyDocument* document_ = nullptr;
};

}  // namespace cloudreel
