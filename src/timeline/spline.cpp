#include "timeline/spline.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/value.h"

namespace cloudreel {

namespace {

// The default handles lie this far from the knot on both axes.
constexpr double kHandleOffset = 0.1;

Point2D offsetBy(Point2D p, Point2D d) { return {p.x + d.x, p.y + d.y}; }

// The first point whose knot or handle, as `where` picks it, lies within r
// of p; the differences and the root are taken in 32-bit floats.
std::int32_t indexWithin(const std::vector<std::shared_ptr<SplinePoint>>& points, float r,
                         Point2D p, Point2D (SplinePoint::*where)() const) {
  for (std::size_t i = 0; i < points.size(); ++i) {
    const Point2D q = (*points[i].*where)();
    const float dx = narrowToFloat(p.x - q.x);
    const float dy = narrowToFloat(p.y - q.y);
    if (std::sqrt(dx * dx + dy * dy) <= r) {
      return static_cast<std::int32_t>(i);
    }
  }
  return -1;
}

}  // namespace

// --- SplinePoint

SplinePoint::SplinePoint(Point2D p)
    : point_(p),
      leftTangent_{p.x - kHandleOffset, p.y - kHandleOffset},
      rightTangent_{p.x + kHandleOffset, p.y + kHandleOffset} {}

std::shared_ptr<SplinePoint> SplinePoint::initWithPoint(Point2D p) {
  return std::make_shared<SplinePoint>(p);
}

std::shared_ptr<SplinePoint> SplinePoint::copy() const {
  auto point = std::make_shared<SplinePoint>(point_);
  point->leftTangent_ = leftTangent_;
  point->rightTangent_ = rightTangent_;
  return point;
}

void SplinePoint::setLeftTangentToPoint(Point2D p) {
  leftTangent_ = {std::min(point_.x, p.x), p.y};
}

void SplinePoint::setRightTangentToPoint(Point2D p) {
  rightTangent_ = {std::max(point_.x, p.x), p.y};
}

void SplinePoint::encodeWithCoder(KeyedArchiver& coder) const {
  coder.encodePoint(point_, "point");
  coder.encodePoint(leftTangent_, "leftTangent");
  coder.encodePoint(rightTangent_, "rightTangent");
}

void SplinePoint::initWithCoder(KeyedUnarchiver& coder) {
  point_ = coder.decodePointForKey("point");
  leftTangent_ = coder.decodePointForKey("leftTangent");
  rightTangent_ = coder.decodePointForKey("rightTangent");
}

// --- Spline

Spline::Spline()
    : points_{SplinePoint::initWithPoint({0.0, 0.0}), SplinePoint::initWithPoint({1.0, 1.0})} {}

std::shared_ptr<Spline> Spline::copy() const {
  auto spline = std::make_shared<Spline>();
  spline->points_ = points_;
  return spline;
}

void Spline::setPoints(std::vector<std::shared_ptr<SplinePoint>> points) {
  std::erase(points, nullptr);
  points_ = std::move(points);
}

bool Spline::isIndex(std::int32_t i) const {
  return i >= 0 && static_cast<std::size_t>(i) < points_.size();
}

float Spline::interpolateSegmentForTime(float s, float y1, float y2, float m1, float m2) {
  const float s2 = s * s;
  const float s3 = s2 * s;
  return (2.0f * s3 - 3.0f * s2 + 1.0f) * y1 + (s3 - 2.0f * s2 + s) * m1 +
         (-2.0f * s3 + 3.0f * s2) * y2 + (s3 - s2) * m2;
}

float Spline::valueForTime(float x) const {
  if (!(x >= 0.0f && x <= 1.0f) || points_.empty()) {
    return 0.0f;
  }
  const std::size_t n = points_.size();
  std::size_t i = 0;
  while (i + 1 < n && points_[i + 1]->point().x < x) {
    ++i;
  }
  if (i + 1 == n) {
    // No knot at or right of x: the curve ends at the last knot's value.
    return narrowToFloat(points_.back()->point().y);
  }
  const Point2D p = points_[i]->point();
  const Point2D q = points_[i + 1]->point();
  const Point2D r = points_[i]->rightTangent();
  const Point2D l = points_[i + 1]->leftTangent();
  // The handle slopes serve as tangents in the segment's own parameter s,
  // not scaled by its width: saved ramps were shaped against exactly this.
  const double s = (x - p.x) / (q.x - p.x);
  const double m1 = (r.y - p.y) / (r.x - p.x);
  const double m2 = (q.y - l.y) / (q.x - l.x);
  return interpolateSegmentForTime(narrowToFloat(s), narrowToFloat(p.y), narrowToFloat(q.y),
                                   narrowToFloat(m1), narrowToFloat(m2));
}

std::int32_t Spline::insertPoint(Point2D p) {
  std::size_t i = 0;
  while (i < points_.size() && !(p.x <= points_[i]->point().x)) {
    ++i;
  }
  points_.insert(points_.begin() + static_cast<std::ptrdiff_t>(i), SplinePoint::initWithPoint(p));
  return static_cast<std::int32_t>(i);
}

std::int32_t Spline::movePointWithIndex(std::int32_t i, Point2D p) {
  if (!isIndex(i)) {
    return i;
  }
  const auto index = static_cast<std::size_t>(i);
  SplinePoint& moved = *points_[index];
  const Point2D old = moved.point();
  const Point2D d{p.x - old.x, p.y - old.y};
  const Point2D left = moved.leftTangent();
  const Point2D right = moved.rightTangent();
  moved.setToPoint(p);
  moved.setLeftTangentToPoint(offsetBy(left, d));
  moved.setRightTangentToPoint(offsetBy(right, d));
  if (index > 0 && points_[index - 1]->point().x > p.x) {
    std::swap(points_[index - 1], points_[index]);
    return i - 1;
  }
  if (index + 1 < points_.size() && p.x > points_[index + 1]->point().x) {
    std::swap(points_[index], points_[index + 1]);
    return i + 1;
  }
  return i;
}

std::int32_t Spline::moveLeftTangentWithIndex(std::int32_t i, Point2D p) {
  if (isIndex(i)) {
    points_[static_cast<std::size_t>(i)]->setLeftTangentToPoint(p);
  }
  return i;
}

std::int32_t Spline::moveRightTangentWithIndex(std::int32_t i, Point2D p) {
  if (isIndex(i)) {
    points_[static_cast<std::size_t>(i)]->setRightTangentToPoint(p);
  }
  return i;
}

void Spline::validatePointAtIndex(std::int32_t i) {
  if (!isIndex(i)) {
    return;
  }
  const auto index = static_cast<std::ptrdiff_t>(i);
  const double x = points_[static_cast<std::size_t>(i)]->point().x;
  if (x < 0.0 || x > 1.0) {
    points_.erase(points_.begin() + index);
  }
}

std::int32_t Spline::indexOfPointWithin(float r, Point2D p) const {
  return indexWithin(points_, r, p, &SplinePoint::point);
}

std::int32_t Spline::indexOfLeftTangentWithin(float r, Point2D p) const {
  return indexWithin(points_, r, p, &SplinePoint::leftTangent);
}

std::int32_t Spline::indexOfRightTangentWithin(float r, Point2D p) const {
  return indexWithin(points_, r, p, &SplinePoint::rightTangent);
}

void Spline::encodeWithCoder(KeyedArchiver& coder) const { coder.encodeList(points_, "points"); }

void Spline::initWithCoder(KeyedUnarchiver& coder) {
  setPoints(coder.decodeListOfClassForKey<SplinePoint>("points").value_or(
      std::vector<std::shared_ptr<SplinePoint>>{}));
}

}  // namespace cloudreel
