#include "app/qt_gl_context.h"

#include <QOffscreenSurface>
#include <QOpenGLContext>
#include <QOpenGLWidget>
#include <QSurfaceFormat>
#include <QThread>

#include "platform/error.h"

namespace cloudreel::app {

namespace {

void setGLContextError(Error* error, const char* message) {
  setError(error, "QtGLContext", 1, message);
}

}  // namespace

void setDefaultSurfaceFormat() {
  QSurfaceFormat format;
  format.setRenderableType(QSurfaceFormat::OpenGL);
  format.setProfile(QSurfaceFormat::CompatibilityProfile);
  format.setVersion(2, 1);
  format.setDepthBufferSize(24);
  format.setAlphaBufferSize(8);
  QSurfaceFormat::setDefaultFormat(format);
}

// --- QtGLContext

QtGLContext::QtGLContext(std::shared_ptr<gl::ShareGroup> group,
                         std::unique_ptr<QOpenGLContext> context,
                         std::unique_ptr<QOffscreenSurface> surface)
    : GLContext(std::move(group)), context_(std::move(context)), surface_(std::move(surface)) {}

std::unique_ptr<QtGLContext> QtGLContext::create(std::shared_ptr<gl::ShareGroup> group,
                                                 Error* error) {
  auto context = std::make_unique<QOpenGLContext>();
  context->setShareContext(QOpenGLContext::globalShareContext());
  context->setFormat(QSurfaceFormat::defaultFormat());
  if (!context->create()) {
    setGLContextError(error, "Qt could not create an OpenGL context");
    return nullptr;
  }
  auto surface = std::make_unique<QOffscreenSurface>();
  surface->setFormat(context->format());
  surface->create();
  if (!surface->isValid()) {
    setGLContextError(error, "Qt could not create an off-screen surface");
    return nullptr;
  }
  // No thread owns the context until one makes it current, so a renderer's
  // thread can take it.
  context->moveToThread(nullptr);
  return std::unique_ptr<QtGLContext>(
      new QtGLContext(std::move(group), std::move(context), std::move(surface)));
}

QtGLContext::~QtGLContext() {
  releaseIfCurrent();
  if (context_->thread() == nullptr) {
    context_->moveToThread(QThread::currentThread());
  }
}

std::unique_ptr<gl::GLContext> QtGLContext::createSharedContext(Error* error) {
  return create(shareGroup(), error);
}

bool QtGLContext::makeCurrentNative(Error* error) {
  if (context_->thread() == nullptr) {
    context_->moveToThread(QThread::currentThread());
  }
  if (context_->thread() != QThread::currentThread() ||
      !context_->makeCurrent(surface_.get())) {
    setGLContextError(error, "the OpenGL context cannot be made current on this thread");
    return false;
  }
  return true;
}

void QtGLContext::doneCurrentNative() {
  context_->doneCurrent();
  context_->moveToThread(nullptr);
}

// --- QtWidgetGLContext

QtWidgetGLContext::QtWidgetGLContext(QOpenGLWidget& widget, std::shared_ptr<gl::ShareGroup> group)
    : GLContext(std::move(group)), widget_(widget) {}

QtWidgetGLContext::~QtWidgetGLContext() { releaseIfCurrent(); }

std::unique_ptr<gl::GLContext> QtWidgetGLContext::createSharedContext(Error* error) {
  return QtGLContext::create(shareGroup(), error);
}

bool QtWidgetGLContext::makeCurrentNative(Error* error) {
  widget_.makeCurrent();
  if (QOpenGLContext::currentContext() != widget_.context()) {
    setGLContextError(error, "the view's OpenGL context cannot be made current");
    return false;
  }
  return true;
}

// Qt keeps the widget's context current around its painting and needs it
// so after paintGL returns; releasing it is Qt's business, not the drawing
// code's.
void QtWidgetGLContext::doneCurrentNative() {}

}  // namespace cloudreel::app
