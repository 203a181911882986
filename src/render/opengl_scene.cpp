#include "render/opengl_scene.h"

#include <epoxy/gl.h>

#include <algorithm>
#include <cmath>

#include "camera/camera.h"
#include "platform/application_defaults.h"
#include "platform/log.h"
#include "platform/user_defaults.h"
#include "platform/value.h"
#include "render/gl/image.h"
#include "render/gl/image_file.h"

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

bool OpenGLScene::captureImageToFile(std::string_view fileName, Error* error) const {
  gl::RgbaImage bitmap;
  bitmap.width = std::max(width_, 0);
  bitmap.height = std::max(height_, 0);
  bitmap.pixels.resize(bitmap.rowBytes() * static_cast<std::size_t>(bitmap.height));
  GLint readFramebuffer = 0;
  glGetIntegerv(GL_READ_FRAMEBUFFER_BINDING, &readFramebuffer);
  glReadBuffer(readFramebuffer == 0 ? GL_FRONT : GL_COLOR_ATTACHMENT0);
  glFinish();
  glPushClientAttrib(GL_CLIENT_PIXEL_STORE_BIT);
  glPixelStorei(GL_PACK_ALIGNMENT, 4);
  glPixelStorei(GL_PACK_ROW_LENGTH, 0);
  glPixelStorei(GL_PACK_SKIP_ROWS, 0);
  glPixelStorei(GL_PACK_SKIP_PIXELS, 0);
  while (glGetError() != GL_NO_ERROR) {
  }
  glReadPixels(0, 0, bitmap.width, bitmap.height, GL_RGBA, GL_UNSIGNED_INT_8_8_8_8_REV,
               bitmap.pixels.data());
  const GLenum glError = glGetError();
  glPopClientAttrib();
  if (glError != GL_NO_ERROR) {
    setError(error, "Cloudreel", 100, fmt::sprintf("Cannot read the view's pixels (OpenGL error %04x)", glError));
    return false;
  }
  gl::flipRows(bitmap.pixels, bitmap.rowBytes(), static_cast<std::size_t>(bitmap.height));
  const std::string path =
      UserDefaults::standardUserDefaults().stringForKey(kImageSavePathKey) + std::string(fileName);
  logf("Screenshot saved at %s", path);
  return gl::writeColorTiff(path, bitmap, error);
}

}  // namespace cloudreel
