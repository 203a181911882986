#pragma once
// The output size of a view or an off-screen render and the projection it
// looks through. The projection takes the field of view and the near and far
// planes of the camera it is set up for; the scene's own fieldOfView, zNear
// and zFar are kept with the scene for the callers that made it.

#include <string_view>

#include "platform/error.h"

namespace cloudreel {

class Camera;

class OpenGLScene {
 public:
  // Sizes in pixels, the field of view in degrees.
  static OpenGLScene initWithWidthHeightFieldOfViewZNearZFar(int width, int height,
                                                             double fieldOfView, float zNear,
                                                             float zFar);
  // Near 1 and far 30.
  static OpenGLScene initWithWidthHeightFieldOfView(int width, int height, double fieldOfView);

  int width() const { return width_; }
  int height() const { return height_; }
  double fieldOfView() const { return fieldOfView_; }
  double zNear() const { return zNear_; }
  double zFar() const { return zFar_; }

  // Width over height in double precision. A zero height gives +infinity
  // (NaN for a 0 × 0 scene) by IEEE division, and the projection set up from
  // it an infinitely wide window: a zero horizontal scale and NaN depth
  // terms, so nothing is drawn, which is all a view without height can show.
  double aspectRatio() const;
  float smallerDimension() const;

  // Takes a view's size in pixels: both values are truncated toward zero
  // (saturating at the int range, NaN as 0), then the viewport is set.
  void setSize(double width, double height);
  // The viewport at (0, 0) covering the scene's size. OpenGL refuses a
  // negative size (GL_INVALID_VALUE) and keeps the viewport it had.
  void setViewport() const;

  // Replaces the projection matrix by a perspective frustum for the camera:
  // its field of view spans the shorter side of the image, and its near and
  // far planes bound the depth. The stereo offset (in the near plane's
  // units) slides the frustum window sideways without moving the camera: a
  // positive offset shows the scene shifted to the left. Leaves the
  // model-view matrix selected.
  void setupFrustumForCamera(const Camera& camera) const;
  void setupFrustumForCamera(const Camera& camera, float stereoOffset) const;

  // Reads what was last drawn, the scene's size from (0, 0), and writes it
  // as a colour TIFF to the user default KTImageSavePath with `fileName`
  // appended directly: no separator is put in between, so the folder is
  // expected to end in "/" (a path of "/tmp/shots" writes
  // "/tmp/shotsout.tiff"). Reads the front buffer of a window, the first
  // colour attachment when a framebuffer object is bound. Logs "Screenshot
  // saved at %s"; false, with the reason, when the pixels cannot be read or
  // the file cannot be written.
  bool captureImageToFile(std::string_view fileName, Error* error = nullptr) const;

 private:
  OpenGLScene(int width, int height, double fieldOfView, double zNear, double zFar)
      : width_(width), height_(height), fieldOfView_(fieldOfView), zNear_(zNear), zFar_(zFar) {}

  int width_;
  int height_;
  double fieldOfView_;
  double zNear_;
  double zFar_;
};

}  // namespace cloudreel
