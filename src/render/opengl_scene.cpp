#include "render/opengl_scene.h"

#include <epoxy/gl.h>

#include <algorithm>
#include <cmath>

#include "camera/camera.h"
#include "platform/value.h"

namespace cloudreel {

OpenGLScene OpenGLScene::initWithWidthHeightFieldOfViewZNearZFar(int width, int height,
                                                                 double fieldOfView, float zNear,
                                                                 float zFar) {
  return OpenGLScene(width, height, fieldOfView, zNear, zFar);
}

OpenGLScene OpenGLScene::initWithWidthHeightFieldOfView(int width, int height, double fieldOfView) {
  return initWithWidthHeightFieldOfViewZNearZFar(width, height, fieldOfView, 1.0f, 30.0f);
}

double OpenGLScene::aspectRatio() const {
  return static_cast<double>(width_) / static_cast<double>(height_);
}

float OpenGLScene::smallerDimension() const {
  return static_cast<float>(std::min(width_, height_));
}

void OpenGLScene::setSize(double width, double height) {
  width_ = saturatingCast<int>(width);
  height_ = saturatingCast<int>(height);
  setViewport();
}

void OpenGLScene::setViewport() const { glViewport(0, 0, width_, height_); }

void OpenGLScene::setupFrustumForCamera(const Camera& camera) const {
  setupFrustumForCamera(camera, 0.0f);
}

void OpenGLScene::setupFrustumForCamera(const Camera& camera, float stereoOffset) const {
  const double a = aspectRatio();
  glMatrixMode(GL_PROJECTION);
  glLoadIdentity();
  // The camera's own field of view and planes, not the scene's: a scene made
  // for a render keeps the values it was given, but the picture is always
  // the camera's.
  const double zNear = camera.zNear();
  const double zFar = camera.zFar();
  const double h = std::tan(static_cast<double>(camera.fieldOfViewInRadians()) * 0.5) * zNear;
  double left = -h;
  double right = h;
  double bottom = -h;
  double top = h;
  // The field of view spans the shorter side: a wide image widens the
  // window, a tall (or square) one heightens it.
  if (a > 1.0) {
    left = -a * h;
    right = a * h;
  } else {
    bottom = -h / a;
    top = h / a;
  }
  left += stereoOffset;
  right += stereoOffset;
  glFrustum(left, right, bottom, top, zNear, zFar);
  glMatrixMode(GL_MODELVIEW);
}

}  // namespace cloudreel
