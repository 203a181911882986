#pragma once
// The document window's OpenGL view: a QOpenGLWidget that hands painting,
// resizing and input to the toolkit-free PointsDocumentGLView. Positions go
// over in the view's pixels with y growing upwards; Control stands for the
// command key and Alt for the option key.

#include <QOpenGLWidget>
#include <memory>

#include "render/points_document_gl_view.h"

namespace cloudreel::gl {
class ShareGroup;
}

namespace cloudreel::app {

class QtWidgetGLContext;

class GLViewWidget : public QOpenGLWidget {
  Q_OBJECT
 public:
  // The widget's context joins `group`, the group of the document's shared
  // context.
  GLViewWidget(std::shared_ptr<gl::ShareGroup> group, QWidget* parent = nullptr);
  ~GLViewWidget() override;

  PointsDocumentGLView& pointView() { return *view_; }
  // Frames painted so far (the screenshot and the tests wait on it).
  int framesPainted() const { return framesPainted_; }

 signals:
  void framePainted();

 protected:
  void initializeGL() override;
  void resizeGL(int width, int height) override;
  void paintGL() override;
  void keyPressEvent(QKeyEvent* event) override;
  void keyReleaseEvent(QKeyEvent* event) override;
  void mousePressEvent(QMouseEvent* event) override;
  void mouseMoveEvent(QMouseEvent* event) override;
  void mouseReleaseEvent(QMouseEvent* event) override;
  void wheelEvent(QWheelEvent* event) override;
  bool event(QEvent* event) override;

 private:
  Point2D viewPoint(const QPointF& position) const;

  std::shared_ptr<gl::ShareGroup> group_;
  std::shared_ptr<PointsDocumentGLView> view_;
  std::unique_ptr<QtWidgetGLContext> glContext_;
  int framesPainted_ = 0;
};

}  // namespace cloudreel::app
