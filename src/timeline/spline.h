#pragma once
// The custom ramp of a clip: a curve y(x) on the unit square through knots
// kept in increasing x, each with a left and a right handle, evaluated
// piecewise with cubic Hermite segments whose tangents are the handle slopes.
// A new spline runs from (0, 0) to (1, 1) and evaluates as y = x.
//
// Knots and handles are pairs of doubles; evaluation narrows a segment's
// parameter, slopes and end values to 32-bit floats and runs the Hermite
// form in floats.

#include <cstdint>
#include <memory>
#include <string_view>
#include <vector>

#include "platform/object.h"
#include "platform/plane.h"

namespace cloudreel {

// A knot and its two handles. Neither handle can cross its knot in x: the
// left one stays at or left of it, the right one at or right of it (as set
// through the setters; setToPoint moves the knot alone).
class SplinePoint : public Object {
 public:
  // A knot at (0, 0) with the default handles; for the archive's factory.
  SplinePoint() : SplinePoint(Point2D{}) {}
  // A knot at p with its handles on the 45-degree line through it, 0.1 away
  // on each axis: (x - 0.1, y - 0.1) and (x + 0.1, y + 0.1).
  explicit SplinePoint(Point2D p);
  static std::shared_ptr<SplinePoint> initWithPoint(Point2D p);
  static std::shared_ptr<SplinePoint> pointWithPoint(Point2D p) { return initWithPoint(p); }

  // A new point with the same knot and handles.
  std::shared_ptr<SplinePoint> copy() const;

  std::string_view className() const override { return "SplinePoint"; }

  Point2D point() const { return point_; }
  Point2D leftTangent() const { return leftTangent_; }
  Point2D rightTangent() const { return rightTangent_; }

  // Moves the knot only; the handles stay where they are.
  void setToPoint(Point2D p) { point_ = p; }
  // Stores (min(knot x, p.x), p.y).
  void setLeftTangentToPoint(Point2D p);
  // Stores (max(knot x, p.x), p.y).
  void setRightTangentToPoint(Point2D p);

  // "point", "leftTangent", "rightTangent", as points. Read back as stored,
  // without clamping; missing keys read as (0, 0).
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 private:
  Point2D point_;
  Point2D leftTangent_;
  Point2D rightTangent_;
};

class Spline : public Object {
 public:
  // Two points, (0, 0) and (1, 1), with the default handles.
  Spline();

  // A new spline whose list holds the very same SplinePoint objects as this
  // one: editing a point through either spline changes both.
  std::shared_ptr<Spline> copy() const;

  std::string_view className() const override { return "Spline"; }

  const std::vector<std::shared_ptr<SplinePoint>>& points() const { return points_; }
  // Null entries are dropped.
  void setPoints(std::vector<std::shared_ptr<SplinePoint>> points);

  // The curve's value at x. Outside 0..1 (or not a number) the value is 0.0,
  // not the end value. Otherwise the segment is the first whose right knot
  // has x ≥ the input, so an input exactly at an inner knot takes the end of
  // the segment on its left; an input left of the first knot (an end point
  // moved inward) is extrapolated on the first segment.
  //
  // When the knots no longer reach the input (the end point at 1 deleted or
  // moved inward), the value is the last knot's y; a single point gives its
  // y, an empty spline 0.0. A segment of zero width or a vertical handle
  // gives an infinity or NaN, as IEEE arithmetic does.
  float valueForTime(float x) const;
  // The cubic Hermite form in 32-bit floats at s in the segment's own 0..1:
  // (2s³ - 3s² + 1)·y1 + (s³ - 2s² + s)·m1 + (-2s³ + 3s²)·y2 + (s³ - s²)·m2.
  static float interpolateSegmentForTime(float s, float y1, float y2, float m1, float m2);

  // Inserts a point with the default handles before the first point whose x
  // is not less than p.x (so before a point of equal x), and answers its
  // index. An x beyond every knot appends the point at the end.
  std::int32_t insertPoint(Point2D p);
  // Moves knot i to p and both its handles by the same offset (clamped
  // against the new knot), then exchanges it with a neighbour it has passed,
  // the left one first: at most one exchange per call. Answers the point's
  // new index; an index outside the list changes nothing and is answered
  // unchanged.
  std::int32_t movePointWithIndex(std::int32_t i, Point2D p);
  // Sets a handle of point i through the clamping setter and answers i; an
  // index outside the list changes nothing.
  std::int32_t moveLeftTangentWithIndex(std::int32_t i, Point2D p);
  std::int32_t moveRightTangentWithIndex(std::int32_t i, Point2D p);
  // Removes point i when its knot's x is below 0 or above 1; an index
  // outside the list does nothing.
  void validatePointAtIndex(std::int32_t i);

  // The first point in list order whose knot (or handle) lies within r of p:
  // distance in 32-bit floats, a distance equal to r counts. -1 when none.
  std::int32_t indexOfPointWithin(float r, Point2D p) const;
  std::int32_t indexOfLeftTangentWithin(float r, Point2D p) const;
  std::int32_t indexOfRightTangentWithin(float r, Point2D p) const;

  // "points", the list. A missing list reads as no points; null entries are
  // dropped.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 private:
  bool isIndex(std::int32_t i) const;

  std::vector<std::shared_ptr<SplinePoint>> points_;
};

}  // namespace cloudreel
