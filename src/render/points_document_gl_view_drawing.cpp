// The document view's drawing: the GL state, the three view modes, the
// text overlay and the 16:9 guide.
#include <epoxy/gl.h>
#include <fmt/printf.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <numbers>

#include "camera/camera.h"
#include "camera/camera_framing.h"
#include "camera/camera_path.h"
#include "camera/scene_camera.h"
#include "platform/application_defaults.h"
#include "platform/color.h"
#include "platform/log.h"
#include "platform/user_defaults.h"
#include "platform/value.h"
#include "render/gl/bitmap_font.h"
#include "render/points_document_gl_view.h"
#include "render/points_document_gl_view_parts.h"
#include "scene/layer.h"
#include "scene/light_source.h"
#include "timeline/time_code.h"

namespace cloudreel {

using namespace document_view;

// --- drawing

void PointsDocumentGLView::prepare() {
  glShadeModel(GL_SMOOTH);
  glEnable(GL_LIGHTING);
  glEnable(GL_DEPTH_TEST);
  glDepthMask(GL_TRUE);
  glEnable(GL_BLEND);
  glBlendFunc(GL_SRC_ALPHA, GL_ONE_MINUS_SRC_ALPHA);
  const GLfloat ambient[] = {0.2f, 0.2f, 0.2f, 1.0f};
  glLightModelfv(GL_LIGHT_MODEL_AMBIENT, ambient);
  const GLfloat white[] = {1.0f, 1.0f, 1.0f, 1.0f};
  glLightfv(GL_LIGHT0, GL_DIFFUSE, white);
  glEnable(GL_LIGHT0);
  // Fog is set up here and switched on by the layers that ask for it.
  const GLfloat fogColour[] = {0.2f, 0.2f, 0.2f, 1.0f};
  glFogi(GL_FOG_MODE, GL_LINEAR);
  glFogf(GL_FOG_START, 5.0f);
  glFogf(GL_FOG_END, 20.0f);
  glFogfv(GL_FOG_COLOR, fogColour);
  const GLfloat materialAmbient[] = {0.1f, 0.1f, 0.1f, 1.0f};
  const GLfloat materialDiffuse[] = {0.9f, 0.9f, 0.9f, 1.0f};
  glMaterialfv(GL_FRONT, GL_AMBIENT, materialAmbient);
  glMaterialfv(GL_FRONT, GL_DIFFUSE, materialDiffuse);
  setFramesPerSecond(UserDefaults::standardUserDefaults().floatForKey(kDefaultFPSKey));
}

void PointsDocumentGLView::reshape(double width, double height) {
  glScene_.setSize(width, height);
  setNeedsDisplay();
}

void PointsDocumentGLView::drawFrame() {
  needsDisplay_ = false;
  glScene_.setViewport();
  const auto background =
      colorForDefaultsKey(UserDefaults::standardUserDefaults(), kBackgroundColorKey);
  if (background) {
    glClearColor(background->red(), background->green(), background->blue(), background->alpha());
  } else {
    glClearColor(0.0f, 0.0f, 0.0f, 1.0f);
  }
  glClearDepth(1.0);
  glClear(GL_COLOR_BUFFER_BIT | GL_DEPTH_BUFFER_BIT);
  if (document_ == nullptr || !document_->sceneCamera() || glScene_.width() <= 0 ||
      glScene_.height() <= 0) {
    return;
  }
  if (viewMode_ == kOrthographic) {
    drawOrthographic();
    return;
  }
  if (viewMode_ != kNormal && viewMode_ != kAnaglyph) {
    return;
  }
  const auto camera = currentCamera();
  if (!camera) {
    return;
  }
  if (viewMode_ == kNormal) {
    drawNormal(*camera);
  } else {
    drawAnaglyph(*camera);
  }
}

void PointsDocumentGLView::drawNormal(const Camera& camera) {
  glScene_.setupFrustumForCamera(camera, 0.0f);
  glLoadIdentity();
  drawDocument();
  glFinish();
}

void PointsDocumentGLView::drawAnaglyph(const Camera& camera) {
  const auto mask = [](const ColorMask& m) {
    glColorMask(m.red ? GL_TRUE : GL_FALSE, m.green ? GL_TRUE : GL_FALSE,
                m.blue ? GL_TRUE : GL_FALSE, GL_TRUE);
  };
  const double shift = static_cast<double>(eyeSeparation_) * 0.5 / kStereoSeparationScale;
  mask(ColorMask{});
  mask(colorMaskForGlasses(glassesType_, 0));
  glScene_.setupFrustumForCamera(camera, static_cast<float>(shift));
  glLoadIdentity();
  drawDocument();
  mask(ColorMask{});
  glClear(GL_DEPTH_BUFFER_BIT);
  mask(colorMaskForGlasses(glassesType_, 1));
  glScene_.setupFrustumForCamera(camera, static_cast<float>(-shift));
  glLoadIdentity();
  drawDocument();
  glFlush();
  mask(ColorMask{});
  glFinish();
}

void PointsDocumentGLView::drawOrthographic() {
  setupOrthographicProjection();
  glLoadIdentity();
  drawDocument();
  glFinish();
}

std::shared_ptr<Camera> PointsDocumentGLView::currentCamera() const {
  if (viewMode_ == kOrthographic) {
    return std::make_shared<Camera>();
  }
  const std::shared_ptr<SceneCamera> sceneCamera =
      document_ != nullptr ? document_->sceneCamera() : nullptr;
  if (isAnimating_ && cameraPath_) {
    if (auto camera = cameraPath_->cameraInWorldSpaceForFrame(animframe_)) {
      return camera;
    }
    return sceneCamera;
  }
  if (cameraMode_ == kSelectedCamera && document_ != nullptr) {
    if (auto selected = document_->selectedCamera()) {
      return selected;
    }
  }
  if (cameraMode_ == kSceneCamera) {
    return sceneCamera;
  }
  return trackball_;
}

void PointsDocumentGLView::drawDocument() {
  if (document_ == nullptr) {
    return;
  }
  glDisable(GL_LIGHTING);
  glPushMatrix();
  const auto camera = currentCamera();
  if (viewMode_ == kOrthographic) {
    // The orthographic view is a default camera looking down -z, with the
    // view's pan, keyboard translation and preset turn around it.
    glTranslated(orthoPan_[0], orthoPan_[1], orthoPan_[2]);
    glTranslated(keyboardTranslation_[0], keyboardTranslation_[1], keyboardTranslation_[2]);
    glRotateAxisAngle(orthoRotation_);
  }
  renderOptions_.setSceneCamera(camera);
  renderOptions_.setValueForKey(document_->bucketOverrideFraction().value_or(0.0f),
                                kRenderOptionBucketGlobal);
  renderOptions_.setValueForKey(document_->overrideBuckets().value_or(false),
                                kRenderOptionBucketOverride);
  document_->drawContentWithOptions(renderOptions_);
  if (camera) {
    camera->setOrientation();
  }
  Layer::drawAxesWithSize(1.0f);
  glPopMatrix();
  if (showTrackball_) {
    // The gizmo floats at twice the near distance in front of the eye (in
    // the orthographic view, 2 units in), scaled with that distance so it
    // looks the same size, turned as the trackball is.
    const double nearDistance =
        viewMode_ == kOrthographic || !camera ? 1.0 : std::max(1e-3f, camera->zNear());
    glPushMatrix();
    glTranslated(0.0, 0.0, -2.0 * nearDistance);
    glRotateAxisAngle(trackball_->intermediate());
    glRotateAxisAngle(trackball_->rotation());
    Layer::drawTrackballWithSize(static_cast<float>(0.2 * nearDistance));
    glPopMatrix();
  }
  drawTextLayer();
}

void PointsDocumentGLView::drawTextLayer() {
  const GLenum error = glGetError();
  if (error == GL_OUT_OF_MEMORY) {
    logf("OUT OF MEMORY!");
    return;
  }
  const int w = glScene_.width();
  const int h = glScene_.height();
  if (w <= 0 || h <= 0) {
    return;
  }
  glMatrixMode(GL_PROJECTION);
  glLoadIdentity();
  glOrtho(0.0, w, 0.0, h, -1.0, 1.0);
  glMatrixMode(GL_MODELVIEW);
  glLoadIdentity();
  // Bitmaps take the raster colour as it is latched, unlit, untextured and
  // unfogged.
  glDisable(GL_LIGHTING);
  glDisable(GL_TEXTURE_2D);
  glDisable(GL_FOG);
  glDisable(GL_DEPTH_TEST);
  glColor4f(1.0f, 1.0f, 1.0f, 1.0f);
  drawTextAt(10, 10, textForGLError(error));
  std::string second;
  if (viewMode_ == kOrthographic) {
    second = std::string(labelForOrthoAxis(orthoAxis_));
  } else if (isAnimating_) {
    second = TimeCode::timeCodeForFrame(animframe_, saturatingCast<int>(framesPerSecond_));
  } else {
    second = "PERSPECTIVE";
  }
  drawTextAt(10, 24, second);
  if (editMode_ != kNoEditing) {
    const auto layer = editingLayer();
    drawTextAt(10, 38, fmt::sprintf("Edit: %s", layer ? layer->name() : std::string()));
  }
  drawGuide();
  glEnable(GL_DEPTH_TEST);
}

void PointsDocumentGLView::drawGuide() const {
  glColor4f(0.0f, 1.0f, 0.0f, 0.5f);
  glLineWidth(1.0f);
  glBegin(GL_LINES);
  for (const GuideLine& line : guideLinesForSize(glScene_.width(), glScene_.height())) {
    glVertex2d(line.x0, line.y0);
    glVertex2d(line.x1, line.y1);
  }
  glEnd();
}

bool PointsDocumentGLView::captureScreenShot(Error* error) const {
  return glScene_.captureImageToFile("out.tiff", error);
}

}  // namespace cloudreel
