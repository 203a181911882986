#pragma once
// Conversions between the rotation forms the system uses, and spherical
// interpolation of quaternions.
//
// Quaternions are (scalar, x, y, z). Axis-angles here are (angle in DEGREES,
// axis x, y, z), the form the trackball keeps and hands to the OpenGL
// rotation call; AffineTransform's axis-angle operations take radians.
// Euler triples are in degrees.

#include <array>

namespace cloudreel {

using Quaternion = std::array<double, 4>;
using AxisAngle = std::array<double, 4>;
using EulerAngles = std::array<double, 3>;
using Matrix16 = std::array<double, 16>;

inline constexpr double kDegreesPerRadian = 57.29577951308232;
inline constexpr double kRadiansPerDegree = 0.017453292519943295;

// The sign pattern here is this system's definition; the camera path turns
// both end orientations into quaternions with it and back with
// quaternionToMatrix, so the pair is self-consistent.
void eulerToQuaternion(Quaternion& q, double a1, double a2, double a3);
// Near the poles (|q0·q3 + q1·q2| > 0.499 of the norm) the singular branch
// answers pitch ±90 and a zero first angle.
void quaternionToEuler(const Quaternion& q, EulerAngles& e);
// The axis is used as given, without normalising.
void axisAngleToQuaternion(Quaternion& q, const AxisAngle& aa);
// The identity gives angle 0 about (1, 0, 0). q0 is not clamped: a value
// beyond ±1 gives NaN, which IEEE arithmetic carries without harm.
void quaternionToAxisAngle(const Quaternion& q, AxisAngle& aa);
// All sixteen elements, in AffineTransform's storage order. This is the
// transpose of AffineTransform::setQuaternionRotation's block for the same
// quaternion; both are kept as they are.
void quaternionToMatrix(const Quaternion& q, Matrix16& m);
// Takes the shorter arc (the FROM quaternion is flipped when the dot product
// is negative), blends linearly when the two are within cos > 0.9999, and
// neither clamps t nor renormalises the result.
void slerpQuaternion(const Quaternion& from, const Quaternion& to, Quaternion& out, double t);

}  // namespace cloudreel
