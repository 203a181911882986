#include "app/spline_editor_window.h"

#include <QLabel>
#include <QMouseEvent>
#include <QPainter>
#include <QPainterPath>
#include <QVBoxLayout>
#include <algorithm>

#include "timeline/spline.h"

namespace cloudreel::app {

namespace {

// The unit square is inset by this many pixels on every side, so the knots
// at its edges (x 0 and 1) show whole and can be grabbed from outside.
constexpr double kInset = 10.0;
// Half the side of a drawn knot, in pixels.
constexpr double kKnotHalfSide = 3.0;

}  // namespace

// --- SplineEditorView

SplineEditorView::SplineEditorView(QWidget* parent) : QWidget(parent) {
  setObjectName(QStringLiteral("SplineEditorView"));
  setMinimumSize(120, 120);
  controller_.setRedraw([this] { update(); });
}

Rect2D SplineEditorView::bounds() const {
  // A view smaller than its insets has no square: the controller ignores
  // events on empty bounds.
  return {0.0, 0.0, std::max(0.0, width() - 2.0 * kInset), std::max(0.0, height() - 2.0 * kInset)};
}

Point2D SplineEditorView::controllerPoint(const QPointF& position) const {
  // The controller's coordinates start at the square's lower left corner,
  // y growing upwards.
  return {position.x() - kInset, (height() - kInset) - position.y()};
}

QPointF SplineEditorView::viewPointForSplinePoint(Point2D p) const {
  const Rect2D square = bounds();
  return {kInset + p.x * square.width, (height() - kInset) - p.y * square.height};
}

bool SplineEditorView::dragging() const {
  return controller_.isDraggingPoint() || controller_.isDraggingLeftTangent() ||
         controller_.isDraggingRightTangent();
}

void SplineEditorView::paintEvent(QPaintEvent*) {
  QPainter painter(this);
  painter.fillRect(rect(), palette().color(QPalette::Base));
  const Rect2D square = bounds();
  if (square.isEmpty()) {
    return;
  }
  painter.setRenderHint(QPainter::Antialiasing);
  // The square and its quarters.
  painter.setPen(QPen(QColor(210, 210, 210), 1.0));
  for (int i = 1; i < 4; ++i) {
    const double f = i / 4.0;
    painter.drawLine(viewPointForSplinePoint({f, 0.0}), viewPointForSplinePoint({f, 1.0}));
    painter.drawLine(viewPointForSplinePoint({0.0, f}), viewPointForSplinePoint({1.0, f}));
  }
  painter.setPen(QPen(QColor(130, 130, 130), 1.0));
  painter.drawRect(
      QRectF(viewPointForSplinePoint({0.0, 1.0}), viewPointForSplinePoint({1.0, 0.0})));

  const std::shared_ptr<Spline>& spline = controller_.theSpline();
  if (!spline) {
    return;
  }
  // The curve, one sample a pixel across the square.
  const int samples = std::max(1, static_cast<int>(square.width));
  QPainterPath curve;
  for (int i = 0; i <= samples; ++i) {
    const double x = static_cast<double>(i) / samples;
    const QPointF at = viewPointForSplinePoint({x, spline->valueForTime(static_cast<float>(x))});
    i == 0 ? curve.moveTo(at) : curve.lineTo(at);
  }
  painter.setPen(QPen(Qt::black, 1.5));
  painter.drawPath(curve);

  // Each knot as a filled square, with lines to its handles.
  for (const auto& point : spline->points()) {
    const QPointF knot = viewPointForSplinePoint(point->point());
    painter.setPen(QPen(Qt::blue, 1.0));
    painter.drawLine(knot, viewPointForSplinePoint(point->leftTangent()));
    painter.drawLine(knot, viewPointForSplinePoint(point->rightTangent()));
    painter.setBrush(Qt::blue);
    painter.drawEllipse(viewPointForSplinePoint(point->leftTangent()), 2.0, 2.0);
    painter.drawEllipse(viewPointForSplinePoint(point->rightTangent()), 2.0, 2.0);
    painter.fillRect(QRectF(knot.x() - kKnotHalfSide, knot.y() - kKnotHalfSide, 2 * kKnotHalfSide,
                            2 * kKnotHalfSide),
                     Qt::black);
  }
}

void SplineEditorView::mousePressEvent(QMouseEvent* event) {
  if (event->button() != Qt::LeftButton) {
    QWidget::mousePressEvent(event);
    return;
  }
  controller_.mouseDown(controllerPoint(event->position()), bounds(),
                        event->modifiers().testFlag(Qt::AltModifier));
}

void SplineEditorView::mouseMoveEvent(QMouseEvent* event) {
  if (!event->buttons().testFlag(Qt::LeftButton)) {
    return;
  }
  controller_.mouseDragged(controllerPoint(event->position()), bounds());
}

void SplineEditorView::mouseReleaseEvent(QMouseEvent* event) {
  if (event->button() != Qt::LeftButton) {
    QWidget::mouseReleaseEvent(event);
    return;
  }
  const bool edited = dragging();
  controller_.mouseUp();
  if (edited && editEnded_) {
    editEnded_();
  }
}

// --- SplineEditorWindow

SplineEditorWindow::SplineEditorWindow(std::shared_ptr<Spline> spline, QWidget* parent,
                                       std::function<void()> changed)
    : QWidget(parent, Qt::Window) {
  setObjectName(QStringLiteral("SplineEditor"));
  setWindowTitle(QStringLiteral("Spline Editor"));
  setAttribute(Qt::WA_DeleteOnClose);
  view_ = new SplineEditorView;
  view_->setEditEnded(std::move(changed));
  auto* layout = new QVBoxLayout(this);
  layout->addWidget(view_);
  auto* hint =
      new QLabel(QStringLiteral("Click to add a knot, drag it out of the square "
                                "sideways to delete it; Alt grabs a handle on a knot."));
  hint->setWordWrap(true);
  layout->addWidget(hint);
  view_->controller().setTheSpline(std::move(spline));
}

SplineEditorWindow* SplineEditorWindow::openOnSpline(std::shared_ptr<Spline> spline,
                                                     QWidget* parent,
                                                     std::function<void()> changed) {
  auto* window = new SplineEditorWindow(std::move(spline), parent, std::move(changed));
  window->show();
  window->raise();
  window->activateWindow();
  return window;
}

}  // namespace cloudreel::app
