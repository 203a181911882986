#include "app/timeline_view.h"

#include <QContextMenuEvent>
#include <QMenu>
#include <QMouseEvent>
#include <QPainter>
#include <QPainterPath>
#include <QWheelEvent>
#include <algorithm>
#include <cmath>

#include "platform/color.h"
#include "platform/log.h"
#include "scene/my_document.h"
#include "timeline/time_code.h"
#include "timeline/timeline.h"
#include "timeline/timeline_clip.h"
#include "timeline/timeline_track.h"

namespace cloudreel::app {

namespace {

QColor qColor(const Color& c, int alpha = 255) {
  return QColor::fromRgbF(c.red(), c.green(), c.blue(), alpha / 255.0f);
}

QRectF qRect(const Rect2D& r) { return {r.x, r.y, r.width, r.height}; }

// The modifiers of a click as the controller knows them: Control (the
// Command key of other systems) prepares a drag; Alt snaps the cursor, and
// so does Shift, as many window managers keep Alt-clicks for themselves.
TimelineMouseModifiers modifiersOf(Qt::KeyboardModifiers m) {
  return {m.testFlag(Qt::ControlModifier),
          m.testFlag(Qt::AltModifier) || m.testFlag(Qt::ShiftModifier)};
}

// Turns a menu description into a Qt menu whose items carry out `choose`.
void fillMenu(QMenu& into, const Menu& menu, const std::function<void(const MenuItem&)>& choose) {
  for (const MenuItem& item : menu.items) {
    if (item.isSeparator) {
      if (!into.isEmpty()) {
        into.addSeparator();
      }
      continue;
    }
    const QString title = QString::fromStdString(item.title);
    if (item.submenu) {
      fillMenu(*into.addMenu(title), *item.submenu, choose);
      continue;
    }
    QAction* action = into.addAction(title);
    action->setCheckable(item.isChecked);
    action->setChecked(item.isChecked);
    // Items with neither an action nor their own command do nothing: shown
    // as they are offered, but not to be chosen.
    action->setEnabled(!item.action.empty() || static_cast<bool>(item.perform));
    QObject::connect(action, &QAction::triggered, &into, [item, choose] { choose(item); });
  }
}

}  // namespace

// --- headers

TimelineHeaderView::TimelineHeaderView(TimelineWindowController& controller, QWidget* parent)
    : QWidget(parent), controller_(controller) {
  setMinimumWidth(150);
}

void TimelineHeaderView::paintEvent(QPaintEvent*) {
  QPainter painter(this);
  painter.fillRect(rect(), palette().window());
  const auto timeline = controller_.timeline();
  if (!timeline) {
    return;
  }
  const Rect2D bounds{0, 0, double(width()), double(height())};
  const auto rows = timeline->headerRowsInView(bounds);
  for (std::size_t i = 0; i < rows.size(); ++i) {
    const TimelineTrack& track = *timeline->tracks()[i];
    const QRectF row = qRect(rows[i]);
    const bool ruler = !track.isEditable();
    painter.fillRect(row, ruler                          ? palette().window()
                          : track.isSelectedForEditing() ? palette().highlight()
                                                         : palette().button());
    painter.setPen(track.isSelectedForEditing() ? palette().highlightedText().color()
                                                : palette().buttonText().color());
    const QString title =
        ruler ? QStringLiteral("Time")
              : QString::fromStdString(track.title().empty() ? track.managedKey() : track.title());
    painter.drawText(row.adjusted(6, 0, -4, 0), Qt::AlignVCenter | Qt::AlignLeft, title);
  }
}

void TimelineHeaderView::mousePressEvent(QMouseEvent* event) {
  const auto timeline = controller_.timeline();
  if (!timeline || event->button() != Qt::LeftButton) {
    return;
  }
  timeline->trackViewWasClicked({0, 0, double(width()), double(height())},
                                {event->position().x(), event->position().y()});
  update();
}

// --- the track area

TimelineTrackArea::TimelineTrackArea(TimelineWindowController& controller, QWidget* parent)
    : QWidget(parent), controller_(controller) {
  setMouseTracking(false);
  setFocusPolicy(Qt::ClickFocus);
  timelineChanged();
}

void TimelineTrackArea::setPixelsPerSecond(float pps) {
  pixelsPerSecond_ = std::clamp(pps, 2.0f, 2000.0f);
  if (const auto timeline = controller_.timeline(); timeline && timeline->fps() > 0) {
    // The ruler reads the scale as frames per pixel.
    controller_.setFrameScale(static_cast<float>(timeline->fps()) / pixelsPerSecond_);
  }
  timelineChanged();
}

void TimelineTrackArea::setCursorForTime(float t) {
  cursorTime_ = t;
  update();
}

void TimelineTrackArea::timelineChanged() {
  const auto timeline = controller_.timeline();
  const float length = timeline ? timeline->totalLengthInSeconds() : 1.0f;
  // Room after the end to drag a span later or scrub past it.
  const int wide = static_cast<int>(std::ceil((length + 4.0f) * pixelsPerSecond_));
  const int high = timeline ? static_cast<int>(std::ceil(timeline->heightOfAllTracks())) + 8 : 40;
  setMinimumSize(std::min(wide, 1 << 20), high);
  update();
}

int TimelineTrackArea::xForTime(float t) const {
  return static_cast<int>(std::lround(static_cast<double>(t) * pixelsPerSecond_));
}

QRect TimelineTrackArea::rowOfTrack(int index) const {
  const auto timeline = controller_.timeline();
  const auto rows = timeline ? timeline->trackRowsInView(bounds()) : std::vector<Rect2D>{};
  return index >= 0 && static_cast<std::size_t>(index) < rows.size()
             ? qRect(rows[static_cast<std::size_t>(index)]).toRect()
             : QRect();
}

Rect2D TimelineTrackArea::bounds() const { return {0, 0, double(width()), double(height())}; }

void TimelineTrackArea::paintEvent(QPaintEvent*) {
  QPainter painter(this);
  painter.fillRect(rect(), palette().base());
  const auto timeline = controller_.timeline();
  if (!timeline) {
    painter.drawText(rect(), Qt::AlignCenter, QStringLiteral("No document"));
    return;
  }
  const auto rows = timeline->trackRowsInView(bounds());
  for (std::size_t i = 0; i < rows.size(); ++i) {
    const TimelineTrack& track = *timeline->tracks()[i];
    if (track.isEditable()) {
      paintTrack(painter, qRect(rows[i]), track);
    } else {
      paintRuler(painter, qRect(rows[i]), *timeline);
    }
  }
  paintMarks(painter, *timeline);
  const int x = xForTime(cursorTime_);
  painter.setPen(QPen(QColor(220, 30, 30), 1));
  painter.drawLine(x, 0, x, height());
}

void TimelineTrackArea::paintRuler(QPainter& painter, const QRectF& row,
                                   const Timeline& timeline) const {
  painter.fillRect(row, palette().window());
  const int fps = timeline.fps();
  if (fps <= 0) {
    return;
  }
  const double pixelsPerFrame = static_cast<double>(pixelsPerSecond_) / fps;
  // Labels at least 90 pixels apart, on whole seconds; frame ticks where
  // they are 4 pixels apart or more.
  int secondsPerLabel = 1;
  while (secondsPerLabel * pixelsPerSecond_ < 90.0f && secondsPerLabel < 3600) {
    secondsPerLabel *= secondsPerLabel == 1 ? 2 : (secondsPerLabel == 2 ? 5 : 2);
  }
  const double visibleEnd = row.width() / pixelsPerSecond_;
  painter.setPen(palette().windowText().color());
  QFont font = painter.font();
  font.setPointSizeF(std::max(6.0, font.pointSizeF() - 2.0));
  painter.setFont(font);
  for (int second = 0; second <= visibleEnd; ++second) {
    const double x = second * static_cast<double>(pixelsPerSecond_);
    const bool labelled = second % secondsPerLabel == 0;
    painter.drawLine(QPointF(x, row.bottom()), QPointF(x, row.top() + (labelled ? 0 : 8)));
    if (labelled) {
      painter.drawText(QPointF(x + 3, row.top() + painter.fontMetrics().ascent()),
                       QString::fromStdString(TimeCode::timeCodeForFrame(second * fps, fps)));
    }
    if (pixelsPerFrame >= 4.0) {
      for (int f = 1; f < fps; ++f) {
        const double fx = x + f * pixelsPerFrame;
        painter.drawLine(QPointF(fx, row.bottom()), QPointF(fx, row.bottom() - 2));
      }
    }
  }
}

void TimelineTrackArea::paintTrack(QPainter& painter, const QRectF& row,
                                   const TimelineTrack& track) const {
  painter.fillRect(row,
                   track.isSelectedForEditing() ? QColor(235, 240, 250) : QColor(245, 245, 245));
  const TimelineClip* selected = controller_.selectedClip().get();
  for (const auto& clip : track.sequencedClips()) {
    const double x0 = static_cast<double>(clip->begin()) * pixelsPerSecond_;
    if (clip->isControlPoint()) {
      // A small diamond on the row's middle line.
      const QPointF c(x0, row.center().y());
      QPainterPath diamond;
      diamond.moveTo(c + QPointF(0, -5));
      diamond.lineTo(c + QPointF(5, 0));
      diamond.lineTo(c + QPointF(0, 5));
      diamond.lineTo(c + QPointF(-5, 0));
      diamond.closeSubpath();
      painter.fillPath(diamond, clip->isEditing() ? QColor(230, 120, 20) : QColor(60, 60, 60));
      continue;
    }
    const double w = static_cast<double>(clip->duration()) * pixelsPerSecond_;
    const QRectF box(x0, row.top() + 2, std::max(w, 1.0), row.height() - 4);
    painter.fillRect(box, qColor(clip->defaultColor()));
    // The ramp as a curve rising across the span.
    if (w >= 4.0 && clip->duration() > 0.0f) {
      QPainterPath ramp;
      const int steps = static_cast<int>(std::min(w / 2.0, 200.0));
      for (int i = 0; i <= steps; ++i) {
        const float ct = clip->duration() * static_cast<float>(i) / static_cast<float>(steps);
        const double v =
            std::clamp(static_cast<double>(clip->rampValueForClipTime(ct, 1.0f)), -0.2, 1.2);
        const QPointF p(box.left() + box.width() * i / steps,
                        box.bottom() - 2 - v * (box.height() - 4));
        i == 0 ? ramp.moveTo(p) : ramp.lineTo(p);
      }
      painter.setPen(QPen(QColor(30, 50, 90), 1));
      painter.drawPath(ramp);
    }
    painter.setPen(QPen(clip.get() == selected ? QColor(220, 120, 0) : QColor(90, 100, 120),
                        clip.get() == selected ? 2 : 1));
    painter.drawRect(box);
  }
}

void TimelineTrackArea::paintMarks(QPainter& painter, const Timeline& timeline) const {
  const float in = timeline.inPoint();
  const float out = timeline.outPoint();
  if (in >= 0.0f && out >= 0.0f && out > in) {
    painter.fillRect(QRectF(in * pixelsPerSecond_, 0, (out - in) * pixelsPerSecond_, height()),
                     QColor(40, 120, 220, 40));
  }
  painter.setPen(QPen(QColor(40, 120, 220), 2));
  if (in >= 0.0f) {
    const double x = in * static_cast<double>(pixelsPerSecond_);
    painter.drawLine(QPointF(x, 0), QPointF(x, height()));
    painter.drawLine(QPointF(x, 1), QPointF(x + 6, 1));
  }
  if (out >= 0.0f) {
    const double x = out * static_cast<double>(pixelsPerSecond_);
    painter.drawLine(QPointF(x, 0), QPointF(x, height()));
    painter.drawLine(QPointF(x, 1), QPointF(x - 6, 1));
  }
}

void TimelineTrackArea::documentChanged() const {
  if (MyDocument* document = controller_.document()) {
    document->hasChanged();
  }
}

void TimelineTrackArea::mousePressEvent(QMouseEvent* event) {
  if (event->button() != Qt::LeftButton) {
    return;
  }
  const Point2D point{event->position().x(), event->position().y()};
  drag_ = controller_.mouseDown(point, bounds(), pixelsPerSecond_, modifiersOf(event->modifiers()));
  const auto timeline = controller_.timeline();
  if (drag_ && timeline) {
    dragEdit_.emplace(drag_->track, drag_->element, timeline->fps());
  } else {
    drag_.reset();
    // A plain click goes on scrubbing while the button is held.
    scrubbing_ = !modifiersOf(event->modifiers()).option;
  }
  update();
}

void TimelineTrackArea::mouseMoveEvent(QMouseEvent* event) {
  const double x = event->position().x();
  if (dragEdit_ && drag_) {
    const float dt = static_cast<float>((x - drag_->start.x) / pixelsPerSecond_);
    logf("drag clip %f", dt);
    dragEdit_->moveTo(dt);
    // The animation at the cursor follows the moved spans.
    controller_.setCursor(controller_.cursor());
    timelineChanged();
  } else if (scrubbing_) {
    controller_.setCursor(static_cast<float>(std::max(0.0, x / pixelsPerSecond_)));
  }
}

void TimelineTrackArea::mouseReleaseEvent(QMouseEvent*) {
  scrubbing_ = false;
  if (dragEdit_) {
    MyDocument* document = controller_.document();
    if (document != nullptr &&
        dragEdit_->commit(&document->undoManager(), [document] { document->hasChanged(); })) {
      documentChanged();
    }
    dragEdit_.reset();
    drag_.reset();
    timelineChanged();
  }
}

void TimelineTrackArea::mouseDoubleClickEvent(QMouseEvent* event) {
  if (event->button() == Qt::LeftButton) {
    scrubbing_ = false;
    controller_.beginEditingAtCursor();
    update();
  }
}

void TimelineTrackArea::contextMenuEvent(QContextMenuEvent* event) {
  const auto timeline = controller_.timeline();
  if (!timeline) {
    return;
  }
  const Point2D point{double(event->pos().x()), double(event->pos().y())};
  const auto track = timeline->trackForCoordinates(point, bounds());
  if (!track || !track->isEditable()) {
    return;
  }
  const auto clip = track->clipForTime(static_cast<float>(point.x / pixelsPerSecond_));
  const Menu description =
      timelineContextMenu(*timeline, *track, clip.get(), controller_.document());
  QMenu menu(this);
  MyDocument* document = controller_.document();
  TimelineMenuHandlers handlers{openSpline_, document ? &document->undoManager() : nullptr,
                                [document] {
                                  if (document != nullptr) {
                                    document->hasChanged();
                                  }
                                }};
  fillMenu(menu, description, [this, timeline, handlers](const MenuItem& item) {
    if (performTimelineMenuItem(item, *timeline, handlers)) {
      documentChanged();
      controller_.setCursor(controller_.cursor());
    }
    timelineChanged();
  });
  menu.exec(event->globalPos());
}

void TimelineTrackArea::wheelEvent(QWheelEvent* event) {
  // Control and the wheel zoom the time axis; the wheel alone scrolls.
  if (event->modifiers().testFlag(Qt::ControlModifier)) {
    emit zoomRequested(event->angleDelta().y() > 0 ? 1 : -1);
    event->accept();
    return;
  }
  event->ignore();
}

}  // namespace cloudreel::app
