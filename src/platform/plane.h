#pragma once
// Points and rectangles of the plane, in 64-bit floats: view coordinates of
// the timeline and the spline editor, and the knots of a spline. Plain
// values, free of any toolkit, so that the editing logic can be tested
// without a window and a toolkit's view only converts its own types.

namespace cloudreel {

struct Point2D {
  double x = 0.0;
  double y = 0.0;

  friend bool operator==(const Point2D&, const Point2D&) = default;
};

struct Rect2D {
  double x = 0.0;
  double y = 0.0;
  double width = 0.0;
  double height = 0.0;

  double maxX() const { return x + width; }
  double maxY() const { return y + height; }
  bool isEmpty() const { return !(width > 0.0) || !(height > 0.0); }
  // Half-open on both axes, as a view's hit test is: a point on the left or
  // lower edge is inside, one on the right or upper edge is not, and an
  // empty rectangle contains nothing.
  bool contains(const Point2D& p) const {
    return !isEmpty() && p.x >= x && p.x < maxX() && p.y >= y && p.y < maxY();
  }

  friend bool operator==(const Rect2D&, const Rect2D&) = default;
};

}  // namespace cloudreel
