#pragma once
// The spline editor: a window showing a clip's custom ramp on the unit
// square, its knots and handles, which the mouse grabs, drags, inserts and
// deletes. The editing rules are SplineEditorController's; the view only
// paints and forwards its mouse with y turned up, so the curve reads like a
// graph.

#include <QWidget>
#include <functional>
#include <memory>

#include "timeline/spline_editor_controller.h"

namespace cloudreel {
class Spline;
}

namespace cloudreel::app {

// The square that shows the spline: (0, 0) at its lower left corner and
// (1, 1) at its upper right.
class SplineEditorView : public QWidget {
  Q_OBJECT
 public:
  explicit SplineEditorView(QWidget* parent = nullptr);

  SplineEditorController& controller() { return controller_; }
  // Called when a drag (or a click) has ended, so the owner of the spline
  // can tell its document; null for none.
  void setEditEnded(std::function<void()> ended) { editEnded_ = std::move(ended); }

  // Where a point of the unit square lies in the view, and back (y up).
  QPointF viewPointForSplinePoint(Point2D p) const;

  QSize sizeHint() const override { return {320, 320}; }

 protected:
  void paintEvent(QPaintEvent* event) override;
  void mousePressEvent(QMouseEvent* event) override;
  void mouseMoveEvent(QMouseEvent* event) override;
  void mouseReleaseEvent(QMouseEvent* event) override;

 private:
  Point2D controllerPoint(const QPointF& position) const;
  Rect2D bounds() const;
  bool dragging() const;

  SplineEditorController controller_;
  std::function<void()> editEnded_;
};

class SplineEditorWindow : public QWidget {
  Q_OBJECT
 public:
  // Opens a window on the spline, in front, deleted when closed. `changed`
  // is called after each edit (the spline's clip belongs to a document that
  // should learn of it); it may be null.
  static SplineEditorWindow* openOnSpline(std::shared_ptr<Spline> spline, QWidget* parent,
                                          std::function<void()> changed = {});

  SplineEditorView& view() { return *view_; }
  const std::shared_ptr<Spline>& theSpline() const { return view_->controller().theSpline(); }

 private:
  SplineEditorWindow(std::shared_ptr<Spline> spline, QWidget* parent,
                     std::function<void()> changed);

  SplineEditorView* view_ = nullptr;
};

}  // namespace cloudreel::app
