#pragma once
// The painted parts of the timeline window: the track headers (titles; a
// click selects a track for cut and lift) and the track area (the ruler,
// every track's spans with their ramps and control points, the marks and
// the cursor). The area forwards clicks, Command-drags and right clicks to
// the core's controller and timeline edits; it decides nothing itself.

#include <QWidget>
#include <memory>
#include <optional>

#include "timeline/timeline_editing.h"
#include "timeline/timeline_window_controller.h"

namespace cloudreel {
class Spline;
}

namespace cloudreel::app {

class TimelineHeaderView : public QWidget {
  Q_OBJECT
 public:
  explicit TimelineHeaderView(TimelineWindowController& controller, QWidget* parent = nullptr);
  QSize sizeHint() const override { return {150, 200}; }

 protected:
  void paintEvent(QPaintEvent* event) override;
  void mousePressEvent(QMouseEvent* event) override;

 private:
  TimelineWindowController& controller_;
};

class TimelineTrackArea : public QWidget {
  Q_OBJECT
 public:
  explicit TimelineTrackArea(TimelineWindowController& controller, QWidget* parent = nullptr);

  // Pixels per second of the time axis (50 to start).
  float pixelsPerSecond() const { return pixelsPerSecond_; }
  void setPixelsPerSecond(float pps);
  // Where the cursor is drawn.
  void setCursorForTime(float t);
  // Sizes the area to the timeline's length and tracks, then repaints.
  void timelineChanged();
  // Where "Edit Spline" opens its editor.
  void setSplineEditorOpener(std::function<void(const std::shared_ptr<Spline>&)> open) {
    openSpline_ = std::move(open);
  }
  // The x of a time and the row of a track, for the tests' clicks.
  int xForTime(float t) const;
  QRect rowOfTrack(int index) const;

 signals:
  void zoomRequested(int steps);

 protected:
  void paintEvent(QPaintEvent* event) override;
  void mousePressEvent(QMouseEvent* event) override;
  void mouseMoveEvent(QMouseEvent* event) override;
  void mouseReleaseEvent(QMouseEvent* event) override;
  // Starts editing the values of the control points at the cursor: the
  // animated properties, changed anywhere, go into them until the cursor
  // moves.
  void mouseDoubleClickEvent(QMouseEvent* event) override;
  void contextMenuEvent(QContextMenuEvent* event) override;
  void wheelEvent(QWheelEvent* event) override;

 private:
  Rect2D bounds() const;
  void paintRuler(QPainter& painter, const QRectF& row, const Timeline& timeline) const;
  void paintTrack(QPainter& painter, const QRectF& row, const TimelineTrack& track) const;
  void paintMarks(QPainter& painter, const Timeline& timeline) const;
  // Something changed the timeline: the document redraws and hears of it.
  void documentChanged() const;

  TimelineWindowController& controller_;
  float pixelsPerSecond_ = 50.0f;
  float cursorTime_ = 0.0f;
  std::optional<TimelineDrag> drag_;
  std::optional<TimelineDragEdit> dragEdit_;
  bool scrubbing_ = false;
  std::function<void(const std::shared_ptr<Spline>&)> openSpline_;
};

}  // namespace cloudreel::app
