#pragma once
// The mouse logic of the spline editor: the view shows the unit square of a
// spline, and a click grabs a knot or a handle (or inserts a knot where
// nothing is hit), a drag moves it, and releasing deletes a knot left
// outside 0..1 in x. The toolkit's view forwards its mouse events here in
// its own coordinates with its bounds, and paints when asked to redraw.

#include <cstdint>
#include <functional>
#include <memory>

#include "platform/plane.h"
#include "timeline/spline.h"

namespace cloudreel {

class SplineEditorController {
 public:
  // No spline: every event does nothing until one is set.
  SplineEditorController() = default;

  const std::shared_ptr<Spline>& theSpline() const { return theSpline_; }
  // Ends any drag in progress (its index belongs to the old spline) and
  // asks for a redraw.
  void setTheSpline(std::shared_ptr<Spline> spline);

  // Called after every event that was handled, so the view repaints.
  void setRedraw(std::function<void()> redraw) { redraw_ = std::move(redraw); }

  bool isDraggingPoint() const { return isDraggingPoint_; }
  bool isDraggingLeftTangent() const { return isDraggingLeftTangent_; }
  bool isDraggingRightTangent() const { return isDraggingRightTangent_; }
  // The point whose knot or handle is being dragged.
  std::int32_t indexOfDragPoint() const { return indexOfDragPoint_; }

  // viewPoint is in the view's coordinates, normalised as x / bounds width
  // and y / bounds height. The hit radius is 5 pixels of the width, used on
  // both axes. Without the Option key the first hit among knot, left handle,
  // right handle is dragged; with it the handles come first, so a handle
  // lying on its knot can be grabbed. A miss inserts a knot there and drags
  // it. Bounds without area (an unlaid-out view) leave the event ignored:
  // nothing changes and nothing is redrawn.
  void mouseDown(Point2D viewPoint, Rect2D bounds, bool optionKey);
  void mouseDragged(Point2D viewPoint, Rect2D bounds);
  // Deletes the dragged point when its knot lies outside 0..1 in x and ends
  // the drag.
  void mouseUp();

 private:
  void redraw() const;
  void endDrag();

  std::shared_ptr<Spline> theSpline_;
  std::function<void()> redraw_;
  bool isDraggingPoint_ = false;
  bool isDraggingLeftTangent_ = false;
  bool isDraggingRightTangent_ = false;
  std::int32_t indexOfDragPoint_ = 0;
};

}  // namespace cloudreel
