#include "geometry/trackball.h"

#include <algorithm>
#include <cmath>

#include "platform/value.h"

namespace cloudreel {
namespace {

// A pointer's offset from the ball's centre. Subtracted in double, which is
// exact for every offset a view can produce and cannot overflow as the
// 64-bit difference of far-off coordinates would.
float offset(std::int64_t p, std::int64_t centre) {
  return narrowToFloat(static_cast<double>(p) - static_cast<double>(centre));
}

// The height of the ball under an offset from its centre; zero off the ball.
float ballHeight(float x, float y, float radius) {
  const float r2 = radius * radius;
  const float d2 = x * x + y * y;
  if (d2 > r2) {
    return 0.0f;
  }
  return static_cast<float>(std::sqrt(static_cast<double>(r2 - d2)));
}

}  // namespace

TrackballDragState& trackballDragState() {
  static TrackballDragState state;
  return state;
}

void trackballBegin(std::int64_t px, std::int64_t py, int originX, int originY, int width,
                    int height) {
  TrackballDragState& s = trackballDragState();
  s.radius = static_cast<float>(std::min(width, height)) * 0.5f;
  // Truncation of a finite value well inside the int64 range.
  s.centreX = static_cast<std::int64_t>(width * 0.5 + originX);
  s.centreY = static_cast<std::int64_t>(height * 0.5 + originY);
  s.start[0] = offset(px, s.centreX);
  s.start[1] = offset(py, s.centreY);
  s.start[2] = ballHeight(s.start[0], s.start[1], s.radius);
}

void trackballRoll(std::int64_t px, std::int64_t py, AxisAngle& out) {
  TrackballDragState& s = trackballDragState();
  s.current[0] = offset(px, s.centreX);
  s.current[1] = offset(py, s.centreY);
  if (std::fabs(s.current[0] - s.start[0]) < 0.001f &&
      std::fabs(s.current[1] - s.start[1]) < 0.001f) {
    return;
  }
  s.current[2] = ballHeight(s.current[0], s.current[1], s.radius);

  const auto& a = s.start;
  const auto& c = s.current;
  const double axis[3] = {static_cast<double>(a[1]) * c[2] - static_cast<double>(a[2]) * c[1],
                          static_cast<double>(a[2]) * c[0] - static_cast<double>(a[0]) * c[2],
                          static_cast<double>(a[0]) * c[1] - static_cast<double>(a[1]) * c[0]};
  const double lengthA =
      std::sqrt(static_cast<double>(a[0]) * a[0] + static_cast<double>(a[1]) * a[1] +
                static_cast<double>(a[2]) * a[2]);
  const double lengthC =
      std::sqrt(static_cast<double>(c[0]) * c[0] + static_cast<double>(c[1]) * c[1] +
                static_cast<double>(c[2]) * c[2]);
  const double axisLength = std::sqrt(axis[0] * axis[0] + axis[1] * axis[1] + axis[2] * axis[2]);
  const double dot = static_cast<double>(a[0]) * c[0] + static_cast<double>(a[1]) * c[1] +
                     static_cast<double>(a[2]) * c[2];
  const float angle =
      static_cast<float>(std::atan2(axisLength / (lengthA * lengthC), dot / (lengthA * lengthC)));
  // A pointer back on the start line gives a zero axis and NaN components,
  // as the trackball always has; IEEE division keeps this defined.
  out = {static_cast<double>(angle) * kDegreesPerRadian, axis[0] / axisLength, axis[1] / axisLength,
         axis[2] / axisLength};
}

void trackballAddRotation(const AxisAngle& drag, AxisAngle& accumulated) {
  Quaternion qa;
  Quaternion qb;
  axisAngleToQuaternion(qa, drag);
  axisAngleToQuaternion(qb, accumulated);
  // Hamilton product qa ⊗ qb: the drag is applied after the accumulated turn.
  const double w = qa[0] * qb[0] - (qa[1] * qb[1] + qa[2] * qb[2] + qa[3] * qb[3]);
  const double x = qa[0] * qb[1] + qb[0] * qa[1] + (qa[2] * qb[3] - qa[3] * qb[2]);
  const double y = qa[0] * qb[2] + qb[0] * qa[2] + (qa[3] * qb[1] - qa[1] * qb[3]);
  const double z = qa[0] * qb[3] + qb[0] * qa[3] + (qa[1] * qb[2] - qa[2] * qb[1]);
  quaternionToAxisAngle({w, x, y, z}, accumulated);
}

}  // namespace cloudreel
