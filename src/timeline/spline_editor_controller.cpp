#include "timeline/spline_editor_controller.h"

#include <utility>

#include "platform/value.h"

namespace cloudreel {

namespace {

// The hit radius in pixels of the view's width.
constexpr double kHitRadiusPixels = 5.0;

// The unit square the view shows. The bounds' origin is not subtracted: the
// view's own coordinates start at its corner.
Point2D normalised(Point2D viewPoint, Rect2D bounds) {
  return {viewPoint.x / bounds.width, viewPoint.y / bounds.height};
}

}  // namespace

void SplineEditorController::setTheSpline(std::shared_ptr<Spline> spline) {
  theSpline_ = std::move(spline);
  endDrag();
  redraw();
}

void SplineEditorController::redraw() const {
  if (redraw_) {
    redraw_();
  }
}

void SplineEditorController::endDrag() {
  isDraggingPoint_ = false;
  isDraggingLeftTangent_ = false;
  isDraggingRightTangent_ = false;
}

void SplineEditorController::mouseDown(Point2D viewPoint, Rect2D bounds, bool optionKey) {
  if (!theSpline_ || bounds.isEmpty()) {
    return;
  }
  // A mouse down without the up of the previous drag starts afresh.
  endDrag();
  const Point2D p = normalised(viewPoint, bounds);
  const float r = narrowToFloat(kHitRadiusPixels / bounds.width);
  const std::int32_t ip = theSpline_->indexOfPointWithin(r, p);
  const std::int32_t il = theSpline_->indexOfLeftTangentWithin(r, p);
  const std::int32_t ir = theSpline_->indexOfRightTangentWithin(r, p);
  const auto grabPoint = [&] {
    isDraggingPoint_ = true;
    indexOfDragPoint_ = ip;
  };
  const auto grabLeft = [&] {
    isDraggingLeftTangent_ = true;
    indexOfDragPoint_ = il;
  };
  const auto grabRight = [&] {
    isDraggingRightTangent_ = true;
    indexOfDragPoint_ = ir;
  };
  if (!optionKey) {
    if (ip >= 0) {
      grabPoint();
    } else if (il >= 0) {
      grabLeft();
    } else if (ir >= 0) {
      grabRight();
    }
  } else {
    if (il >= 0) {
      grabLeft();
    } else if (ir >= 0) {
      grabRight();
    } else if (ip >= 0) {
      grabPoint();
    }
  }
  if (!isDraggingPoint_ && !isDraggingLeftTangent_ && !isDraggingRightTangent_) {
    indexOfDragPoint_ = theSpline_->insertPoint(p);
    isDraggingPoint_ = true;
  }
  redraw();
}

void SplineEditorController::mouseDragged(Point2D viewPoint, Rect2D bounds) {
  if (!theSpline_ || bounds.isEmpty()) {
    return;
  }
  const Point2D p = normalised(viewPoint, bounds);
  if (isDraggingPoint_) {
    indexOfDragPoint_ = theSpline_->movePointWithIndex(indexOfDragPoint_, p);
  } else if (isDraggingLeftTangent_) {
    theSpline_->moveLeftTangentWithIndex(indexOfDragPoint_, p);
  } else if (isDraggingRightTangent_) {
    theSpline_->moveRightTangentWithIndex(indexOfDragPoint_, p);
  }
  redraw();
}

void SplineEditorController::mouseUp() {
  if (!theSpline_) {
    return;
  }
  if (isDraggingPoint_ || isDraggingLeftTangent_ || isDraggingRightTangent_) {
    // After a handle drag its knot is checked the same way; it has not moved.
    theSpline_->validatePointAtIndex(indexOfDragPoint_);
    endDrag();  // only one flag is ever set
  }
  redraw();
}

}  // namespace cloudreel
