#pragma once
// The application's OpenGL contexts in the drawing code's context interface.
// Every context of the application is made by Qt in one object-sharing
// group (Qt's global share context): the contexts of the view widgets and
// the off-screen contexts each document shares with its views and renderers.
//
// QtGLContext owns an off-screen context of its own; it may be made current
// on any thread, one at a time (it moves to the thread that makes it
// current). QtWidgetGLContext stands for the context of a QOpenGLWidget,
// which the widget owns: making it current binds the widget's framebuffer.

#include <memory>

#include "render/gl/gl_context.h"

class QOffscreenSurface;
class QOpenGLContext;
class QOpenGLWidget;

namespace cloudreel::app {

class QtGLContext final : public gl::GLContext {
 public:
  // A new context sharing with Qt's global share context, in the given
  // group (a new group when null). Must be called on the GUI thread, which
  // makes the off-screen surface. Null, with the error, when Qt cannot make
  // one.
  static std::unique_ptr<QtGLContext> create(std::shared_ptr<gl::ShareGroup> group, Error* error);
  ~QtGLContext() override;

  std::unique_ptr<gl::GLContext> createSharedContext(Error* error) override;

 private:
  QtGLContext(std::shared_ptr<gl::ShareGroup> group, std::unique_ptr<QOpenGLContext> context,
              std::unique_ptr<QOffscreenSurface> surface);
  bool makeCurrentNative(Error* error) override;
  void doneCurrentNative() override;

  std::unique_ptr<QOpenGLContext> context_;
  std::unique_ptr<QOffscreenSurface> surface_;
};

class QtWidgetGLContext final : public gl::GLContext {
 public:
  // The widget must have been initialised (its context exists) and must
  // outlive this object.
  QtWidgetGLContext(QOpenGLWidget& widget, std::shared_ptr<gl::ShareGroup> group);
  ~QtWidgetGLContext() override;

  std::unique_ptr<gl::GLContext> createSharedContext(Error* error) override;

 private:
  bool makeCurrentNative(Error* error) override;
  void doneCurrentNative() override;

  QOpenGLWidget& widget_;
};

// The format every context of the application asks for: the OpenGL 2
// fixed-function pipeline in a compatibility profile, a 24-bit depth buffer.
// Set as Qt's default before the application object is made.
void setDefaultSurfaceFormat();

}  // namespace cloudreel::app
