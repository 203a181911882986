#include "app/gl_view_widget.h"

#include <QKeyEvent>
#include <QMouseEvent>
#include <QNativeGestureEvent>
#include <QWheelEvent>

#include "app/qt_gl_context.h"
#include "platform/log.h"

namespace cloudreel::app {

namespace {

ViewModifiers viewModifiers(Qt::KeyboardModifiers modifiers) {
  return ViewModifiers{modifiers.testFlag(Qt::ShiftModifier),
                       modifiers.testFlag(Qt::AltModifier),
                       modifiers.testFlag(Qt::ControlModifier)};
}

}  // namespace

GLViewWidget::GLViewWidget(std::shared_ptr<gl::ShareGroup> group, QWidget* parent)
    : QOpenGLWidget(parent),
      group_(std::move(group)),
      view_(std::make_shared<PointsDocumentGLView>()) {
  setFocusPolicy(Qt::StrongFocus);
  setMinimumSize(160, 120);
  view_->setDisplayHandler([this] { update(); });
}

GLViewWidget::~GLViewWidget() {
  view_->setDisplayHandler(nullptr);
  view_->setDocument(nullptr);
  if (glContext_) {
    // Names the view's drawing made in this context go while it is current.
    gl::CurrentContext current(*glContext_);
    view_.reset();
  }
  glContext_.reset();
}

void GLViewWidget::initializeGL() {
  glContext_ = std::make_unique<QtWidgetGLContext>(*this, group_);
  gl::CurrentContext current(*glContext_);
  view_->prepare();
}

void GLViewWidget::resizeGL(int width, int height) {
  const double ratio = devicePixelRatioF();
  view_->reshape(width * ratio, height * ratio);
}

void GLViewWidget::paintGL() {
  Error error;
  gl::CurrentContext current(*glContext_, &error);
  if (!current) {
    logErrorf("cannot draw the view: %s", error.message);
    return;
  }
  view_->drawFrame();
  ++framesPainted_;
  emit framePainted();
}

Point2D GLViewWidget::viewPoint(const QPointF& position) const {
  const double ratio = devicePixelRatioF();
  return Point2D{position.x() * ratio, (height() - position.y()) * ratio};
}

void GLViewWidget::keyPressEvent(QKeyEvent* event) {
  if (event->text().isEmpty()) {
    QOpenGLWidget::keyPressEvent(event);
    return;
  }
  view_->keyDown(event->text().toStdString(), event->isAutoRepeat());
}

void GLViewWidget::keyReleaseEvent(QKeyEvent* event) {
  if (event->text().isEmpty() || event->isAutoRepeat()) {
    QOpenGLWidget::keyReleaseEvent(event);
    return;
  }
  view_->keyUp(event->text().toStdString());
}

void GLViewWidget::mousePressEvent(QMouseEvent* event) {
  const Point2D point = viewPoint(event->position());
  if (event->button() == Qt::LeftButton) {
    view_->mouseDown(point, viewModifiers(event->modifiers()));
  } else if (event->button() == Qt::RightButton) {
    view_->rightMouseDown(point);
  }
}

void GLViewWidget::mouseMoveEvent(QMouseEvent* event) {
  const Point2D point = viewPoint(event->position());
  if (event->buttons().testFlag(Qt::LeftButton)) {
    view_->mouseDragged(point);
  } else if (event->buttons().testFlag(Qt::RightButton)) {
    view_->rightMouseDragged(point);
  }
}

void GLViewWidget::mouseReleaseEvent(QMouseEvent* event) {
  const Point2D point = viewPoint(event->position());
  if (event->button() == Qt::LeftButton) {
    view_->mouseUp(point);
  } else if (event->button() == Qt::RightButton) {
    view_->rightMouseUp(point);
  }
}

void GLViewWidget::wheelEvent(QWheelEvent* event) {
  // One notch of a common wheel is 120 eighths of a degree.
  const double lines = event->angleDelta().y() / 120.0;
  if (lines != 0.0) {
    view_->scrollWheel(lines, viewModifiers(event->modifiers()));
  }
  event->accept();
}

bool GLViewWidget::event(QEvent* event) {
  if (event->type() != QEvent::NativeGesture) {
    return QOpenGLWidget::event(event);
  }
  const auto* gesture = static_cast<QNativeGestureEvent*>(event);
  const ViewModifiers modifiers = viewModifiers(gesture->modifiers());
  switch (gesture->gestureType()) {
    case Qt::ZoomNativeGesture:
      view_->magnify(gesture->value(), modifiers);
      break;
    case Qt::RotateNativeGesture:
      view_->rotateGesture(gesture->value(), modifiers);
      break;
    case Qt::EndNativeGesture:
      view_->endGesture();
      break;
    default:
      break;
  }
  return true;
}

}  // namespace cloudreel::app
