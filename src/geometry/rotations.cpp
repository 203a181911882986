#include "geometry/rotations.h"

#include <cmath>

namespace cloudreel {

void eulerToQuaternion(Quaternion& q, double a1, double a2, double a3) {
  const double h = kRadiansPerDegree * 0.5;
  // The degree-to-radian factor is π/180 with π = 3.141592653589793.
  const double s1 = std::sin(a1 * h), c1 = std::cos(a1 * h);
  const double s2 = std::sin(a2 * h), c2 = std::cos(a2 * h);
  const double s3 = std::sin(a3 * h), c3 = std::cos(a3 * h);
  q[0] = c1 * c2 * c3 + s1 * s2 * s3;
  q[1] = -c1 * s2 * c3 - s1 * c2 * s3;
  q[2] = c1 * s2 * s3 - s1 * c2 * c3;
  q[3] = s1 * s2 * c3 - c1 * c2 * s3;
}

void quaternionToEuler(const Quaternion& q, EulerAngles& e) {
  const auto [q0, q1, q2, q3] = q;
  const double n = q0 * q0 + q1 * q1 + q2 * q2 + q3 * q3;
  const double test = q0 * q3 + q1 * q2;
  // The threshold is the single-precision 0.499.
  const double limit = static_cast<double>(0.499f) * n;
  if (test > limit) {
    e = {0.0, 90.0, 2.0 * std::atan2(q1, q0) * kDegreesPerRadian};
  } else if (test < -limit) {
    e = {0.0, -90.0, -2.0 * std::atan2(q1, q0) * kDegreesPerRadian};
  } else {
    e[2] = std::atan2(2 * q0 * q2 - 2 * q1 * q3, q0 * q0 + q1 * q1 - q2 * q2 - q3 * q3) *
           kDegreesPerRadian;
    e[1] = std::asin(2 * test / n) * kDegreesPerRadian;
    e[0] = std::atan2(2 * q0 * q1 - 2 * q2 * q3, q0 * q0 - q1 * q1 + q2 * q2 - q3 * q3) *
           kDegreesPerRadian;
  }
}

void axisAngleToQuaternion(Quaternion& q, const AxisAngle& aa) {
  const double h = aa[0] * kRadiansPerDegree * 0.5;
  const double s = std::sin(h);
  q = {std::cos(h), aa[1] * s, aa[2] * s, aa[3] * s};
}

void quaternionToAxisAngle(const Quaternion& q, AxisAngle& aa) {
  if (std::fabs(q[0] - 1.0) < 1e-7) {
    aa = {0.0, 1.0, 0.0, 0.0};
    return;
  }
  const double theta = std::acos(q[0]);
  const double s = std::sin(theta);
  aa = {2.0 * theta * kDegreesPerRadian, q[1] / s, q[2] / s, q[3] / s};
}

void quaternionToMatrix(const Quaternion& q, Matrix16& m) {
  const auto [q0, q1, q2, q3] = q;
  m = {1 - 2 * q2 * q2 - 2 * q3 * q3, 2 * q1 * q2 - 2 * q0 * q3, 2 * q0 * q2 + 2 * q1 * q3, 0,
       2 * q0 * q3 + 2 * q1 * q2, 1 - 2 * q1 * q1 - 2 * q3 * q3, 2 * q2 * q3 - 2 * q0 * q1, 0,
       2 * q1 * q3 - 2 * q0 * q2, 2 * q0 * q1 + 2 * q2 * q3, 1 - 2 * q1 * q1 - 2 * q2 * q2, 0,
       0, 0, 0, 1};
}

void slerpQuaternion(const Quaternion& from, const Quaternion& to, Quaternion& out, double t) {
  Quaternion a = from;
  double cosine = a[0] * to[0] + a[1] * to[1] + a[2] * to[2] + a[3] * to[3];
  if (cosine < 0.0) {
    for (double& c : a) {
      c = -c;
    }
    cosine = -cosine;
  }
  double k0;
  double k1;
  // The threshold is the single-precision 0.9999.
  if (cosine > static_cast<double>(0.9999f)) {
    k0 = 1.0 - t;
    k1 = t;
  } else {
    const double sine = std::sqrt(1.0 - cosine * cosine);
    const double theta = std::atan2(sine, cosine);
    k0 = std::sin((1.0 - t) * theta) / sine;
    k1 = std::sin(t * theta) / sine;
  }
  for (std::size_t i = 0; i < 4; ++i) {
    out[i] = k0 * a[i] + k1 * to[i];
  }
}

}  // namespace cloudreel
