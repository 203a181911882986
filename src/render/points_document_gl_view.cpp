#include "render/points_document_gl_view.h"

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
#include "render/points_document_gl_view_parts.h"
#include "scene/layer.h"
#include "scene/light_source.h"
#include "timeline/time_code.h"

namespace cloudreel {
namespace document_view {

int validAxis(int axis) { return axis >= 0 && axis < 6 ? axis : 0; }

// Rotates v by an axis-angle in degrees (right-handed, as glRotated turns).
// A zero axis turns nothing.
Vec3 rotated(const Vec3& v, const AxisAngle& r) {
  const double len = std::hypot(r[1], r[2], r[3]);
  if (!(len > 0) || r[0] == 0.0) {
    return v;
  }
  // The transform's rotation takes radians and a unit axis.
  Vec3 out = v;
  AffineTransform::initWithAxisAngleRotation(
      {r[0] * kRadiansPerDegree, r[1] / len, r[2] / len, r[3] / len})
      ->multiply3Vector(out);
  return out;
}

Vec3 inverseRotated(const Vec3& v, const AxisAngle& r) {
  return rotated(v, {-r[0], r[1], r[2], r[3]});
}

// Solves L·x = w for the linear block of a transform (column-major, element
// (row, col) at 4·col + row); nothing for a singular or non-finite block.
std::optional<Vec3> solveLinear(const AffineTransform& t, const Vec3& w) {
  const auto& m = t.mx();
  const auto e = [&m](int r, int c) { return m[static_cast<std::size_t>(4 * c + r)]; };
  const double det = e(0, 0) * (e(1, 1) * e(2, 2) - e(1, 2) * e(2, 1)) -
                     e(0, 1) * (e(1, 0) * e(2, 2) - e(1, 2) * e(2, 0)) +
                     e(0, 2) * (e(1, 0) * e(2, 1) - e(1, 1) * e(2, 0));
  if (!std::isfinite(det) || std::abs(det) < 1e-12) {
    return std::nullopt;
  }
  // Cramer's rule, column by column.
  const auto detWith = [&](int col) {
    const auto f = [&](int r, int c) {
      return c == col ? w[static_cast<std::size_t>(r)] : e(r, c);
    };
    return f(0, 0) * (f(1, 1) * f(2, 2) - f(1, 2) * f(2, 1)) -
           f(0, 1) * (f(1, 0) * f(2, 2) - f(1, 2) * f(2, 0)) +
           f(0, 2) * (f(1, 0) * f(2, 1) - f(1, 1) * f(2, 0));
  };
  return Vec3{detWith(0) / det, detWith(1) / det, detWith(2) / det};
}

// The layer's placement around its editing origin: objectToWorld ·
// animationTransform.
std::shared_ptr<AffineTransform> placementOf(const Layer& layer) {
  auto t = layer.animationTransform()->copy();
  t->multiplyByMatrix(*layer.objectToWorld());
  return t;
}

void glRotateAxisAngle(const AxisAngle& r) {
  if (r[0] != 0.0) {
    glRotated(r[0], r[1], r[2], r[3]);
  }
}

void drawTextAt(int x, int y, std::string_view text) {
  glRasterPos2i(x, y);
  gl::BitmapFont::drawString(text.substr(0, kLineLength));
}

// Moves the camera to the framing as one undo step named `name`; undoing
// puts back where it was, which registers the redo the same way.
void placeCameraUndoably(MyDocument& document, const std::shared_ptr<Camera>& camera,
                         const CameraFraming& to, const std::string& name) {
  CameraFraming from;
  camera->objectToWorld()->getTranslation(from.position);
  from.zNear = camera->zNear();
  from.zFar = camera->zFar();
  MyDocument* owner = &document;  // owns the undo manager, so outlives the step
  document.undoManager().registerUndoWithTarget(
      camera.get(), [owner, weak = std::weak_ptr<Camera>(camera), from, name] {
        if (const auto c = weak.lock()) {
          placeCameraUndoably(*owner, c, from, name);
        }
      });
  document.undoManager().setActionName(name);
  camera->setTranslate(Vector3(to.position));
  camera->setZNear(to.zNear);
  camera->setZFar(to.zFar);
  document.hasChanged();
}

}  // namespace document_view

using namespace document_view;

PointsDocumentGLView::PointsDocumentGLView(RunLoop& runLoop)
    : runLoop_(runLoop),
      glScene_(OpenGLScene::initWithWidthHeightFieldOfView(0, 0, 30.0)),
      trackball_(std::make_shared<RWTrackball>()) {
  renderOptions_.setSceneCamera(nullptr);
  renderOptions_.setValueForKey(true, kRenderOptionEditor);
  renderOptions_.setValueForKey(false, kRenderOptionBucketOverride);
  renderOptions_.setValueForKey(1.0f, kRenderOptionBucketGlobal);
  framesPerSecond_ = UserDefaults::standardUserDefaults().floatForKey(kDefaultFPSKey);
  // The free camera starts where a new document's scene camera stands, 15
  // units along +z, so that it sees the origin rather than standing in it.
  trackball_->objectToWorld()->setTranslationZ(15.0);
}

PointsDocumentGLView::~PointsDocumentGLView() {
  invalidateTimer();
  if (const auto layer = editingLayer()) {
    layer->setIsEditing(false);
  }
  if (document_ != nullptr) {
    document_->removeView(*this);
  }
}

const PropertyTable& PointsDocumentGLView::properties() const {
  using T = PointsDocumentGLView;
  static const PropertyTable table(
      &Object::objectProperties(),
      {property<T>("viewMode", &T::viewMode, &T::setViewMode),
       property<T>("editMode", &T::editMode, &T::setEditMode),
       property<T>("cameraMode", &T::cameraMode, &T::setCameraMode),
       property<T>("orthoScale", &T::orthoScale, &T::setOrthoScale),
       property<T>("glassesType", &T::glassesType, &T::setGlassesType),
       readOnlyProperty<T>("shouldDrawAnaglyph", &T::shouldDrawAnaglyph),
       property<T>("eyeSeparation", &T::eyeSeparation, &T::setEyeSeparation),
       property<T>("animframe", &T::animframe, &T::setAnimframe),
       property<T>("loopAnimation", &T::loopAnimation, &T::setLoopAnimation),
       property<T>("framesPerSecond", &T::framesPerSecond, &T::setFramesPerSecond),
       property<T>("showTrackball", &T::showTrackball, &T::setShowTrackball),
       property<T>("isFullScreen", &T::isFullScreen, &T::setIsFullScreen),
       readOnlyProperty<T>("isPanning", &T::isPanning),
       readOnlyProperty<T>("isPanningKeyDown", &T::isPanningKeyDown),
       readOnlyProperty<T>("isAnimating", &T::isAnimating)});
  return table;
}

// --- document and redraw

void PointsDocumentGLView::setDocument(MyDocument* document) {
  if (document == document_) {
    return;
  }
  stopAnimating();
  if (editMode_ != kNoEditing) {
    setEditMode(kNoEditing);
  }
  if (document_ != nullptr) {
    document_->removeView(*this);
  }
  document_ = document;
  if (document_ != nullptr) {
    document_->addView(*this);
  }
  setNeedsDisplay();
}

void PointsDocumentGLView::setNeedsDisplay() {
  needsDisplay_ = true;
  if (displayHandler_) {
    displayHandler_();
  }
}

// --- properties

void PointsDocumentGLView::storeViewMode(std::int32_t mode) {
  willChangeValueForKey("shouldDrawAnaglyph");
  willChangeValueForKey("viewMode");
  viewMode_ = mode;
  didChangeValueForKey("viewMode");
  didChangeValueForKey("shouldDrawAnaglyph");
}

void PointsDocumentGLView::setViewMode(std::int32_t mode) {
  if (mode == kOrthographic) {
    // The preset nearest what is being looked at now.
    std::shared_ptr<AffineTransform> m;
    if (cameraMode_ == kTrackballCamera) {
      m = trackball_->matrix();
    } else if (document_ != nullptr && document_->sceneCamera()) {
      m = document_->sceneCamera()->inertialToObject()->copy();
    } else {
      m = std::make_shared<AffineTransform>();
    }
    cameraPreset(nearestOrthoAxisForMatrix(*m));
    return;
  }
  if (editMode_ != kNoEditing) {
    setEditMode(kNoEditing);
  }
  storeViewMode(mode);
  setNeedsDisplay();
}

void PointsDocumentGLView::setEditMode(std::int32_t mode) {
  if (const auto old = editingLayer()) {
    old->setIsEditing(false);
  }
  editingLayer_.reset();
  std::shared_ptr<Layer> layer;
  if (document_ != nullptr) {
    if (mode == kEditLight) {
      layer = document_->lightSource();
    } else if (mode == kEditSelectedLayer) {
      layer = document_->selectedLayer();
      if (layer && layer->isLocked()) {
        layer.reset();
      }
    }
  }
  willChangeValueForKey("editMode");
  if (!layer) {
    logf("cancel editing");
    mode = kNoEditing;
  } else {
    layer->setIsEditing(true);
    editingLayer_ = layer;
    if (viewMode_ != kOrthographic) {
      setViewMode(kOrthographic);
    }
  }
  editMode_ = mode;
  didChangeValueForKey("editMode");
  setNeedsDisplay();
}

void PointsDocumentGLView::setCameraMode(std::int32_t mode) {
  changeValueForKey("cameraMode", cameraMode_, mode);
  setNeedsDisplay();
}

void PointsDocumentGLView::setOrthoScale(float v) {
  if (std::isnan(v)) {
    return;
  }
  changeValueForKey("orthoScale", orthoScale_, v);
  setNeedsDisplay();
}

void PointsDocumentGLView::setGlassesType(std::int32_t v) {
  changeValueForKey("glassesType", glassesType_, v);
  setNeedsDisplay();
}

void PointsDocumentGLView::setEyeSeparation(float v) {
  changeValueForKey("eyeSeparation", eyeSeparation_, v);
  setNeedsDisplay();
}

void PointsDocumentGLView::setAnimframe(std::int32_t v) {
  changeValueForKey("animframe", animframe_, v);
  setNeedsDisplay();
}

void PointsDocumentGLView::setShowTrackball(bool v) {
  changeValueForKey("showTrackball", showTrackball_, v);
  setNeedsDisplay();
}

void PointsDocumentGLView::setIsAnimating(bool v) {
  changeValueForKey("isAnimating", isAnimating_, v);
}

// --- orthographic views

void PointsDocumentGLView::cameraPreset(int axis) {
  if (axis < 0 || axis >= 6) {
    logf("strange OrthoView axis set!");
  }
  orthoAxis_ = validAxis(axis);
  orthoRotation_ = kPresets[static_cast<std::size_t>(orthoAxis_)].rotation;
  storeViewMode(kOrthographic);
  setNeedsDisplay();
}

void PointsDocumentGLView::zoomIn() { setOrthoScale(orthoScale_ + 1.0f); }
void PointsDocumentGLView::zoomOut() { setOrthoScale(orthoScale_ - 1.0f); }

std::string_view PointsDocumentGLView::labelForOrthoAxis(int axis) {
  return kPresets[static_cast<std::size_t>(validAxis(axis))].label;
}

int PointsDocumentGLView::nearestOrthoAxisForMatrix(const AffineTransform& m) {
  // The view direction (0, 0, 1) scored against each basis vector and its
  // negation. A later candidate replaces the best only when strictly
  // better, so a direction exactly between two keeps the earlier one in the
  // order +Z, +Y, +X, -Z, -Y, -X. The axis numbers are those the view has
  // always given these candidates.
  const double z = m.basisVectorZ()->z();
  const double y = m.basisVectorY()->z();
  const double x = m.basisVectorX()->z();
  const std::array<std::pair<double, int>, 6> candidates{
      {{z, 2}, {y, 1}, {x, 0}, {-z, 5}, {-y, 4}, {-x, 3}}};
  auto best = candidates[0];
  for (const auto& candidate : candidates) {
    if (candidate.first > best.first) {
      best = candidate;
    }
  }
  return best.second;
}

double PointsDocumentGLView::orthoFactor() const {
  return std::exp2(std::clamp(static_cast<double>(orthoScale_), -60.0, 60.0));
}

double PointsDocumentGLView::worldUnitsPerPixel() const {
  const double s = glScene_.smallerDimension();
  // The shorter side spans 2 / 2^orthoScale units. A view without area has
  // no pixels to measure: drags there move nothing.
  return s > 0 ? 2.0 / (orthoFactor() * s) : 0.0;
}

void PointsDocumentGLView::setupOrthographicProjection() const {
  const double unit = worldUnitsPerPixel();
  const double halfWidth = glScene_.width() * unit / 2;
  const double halfHeight = glScene_.height() * unit / 2;
  glMatrixMode(GL_PROJECTION);
  glLoadIdentity();
  glOrtho(-halfWidth, halfWidth, -halfHeight, halfHeight, -kOrthoDepth, kOrthoDepth);
  glMatrixMode(GL_MODELVIEW);
}

ColorMask PointsDocumentGLView::colorMaskForGlasses(std::int32_t glassesType, int pass) {
  constexpr ColorMask kR{true, false, false}, kG{false, true, false}, kB{false, false, true},
      kGB{false, true, true}, kAll{};
  static constexpr std::array<std::array<ColorMask, 2>, 6> kPairs{
      {{kR, kB}, {kR, kG}, {kR, kGB}, {kB, kR}, {kG, kR}, {kGB, kR}}};
  if (glassesType < 1 || glassesType > 6 || (pass != 0 && pass != 1)) {
    return kAll;
  }
  return kPairs[static_cast<std::size_t>(glassesType - 1)][static_cast<std::size_t>(pass)];
}

std::array<GuideLine, 2> PointsDocumentGLView::guideLinesForSize(double w, double h) {
  // A view at most 16:9 wide gets bars above and below; a wider one at the
  // sides. A zero height counts as wider than 16:9 (the quotient is
  // infinite or NaN, and NaN fails the comparison).
  if (w / h <= kGuideAspect) {
    const double y = (h - w / kGuideAspect) / 2;
    return {GuideLine{0, y, w, y}, GuideLine{0, h - y, w, h - y}};
  }
  const double x = (w - h * kGuideAspect) / 2;
  return {GuideLine{x, 0, x, h}, GuideLine{w - x, 0, w - x, h}};
}

std::string PointsDocumentGLView::textForGLError(unsigned code) {
  static constexpr std::array<std::string_view, 6> kNames{
      "GL_INVALID_ENUM",   "GL_INVALID_VALUE",   "GL_INVALID_OPERATION",
      "GL_STACK_OVERFLOW", "GL_STACK_UNDERFLOW", "GL_OUT_OF_MEMORY"};
  if (code == GL_NO_ERROR) {
    return "NO ERROR";
  }
  if (code >= 0x0500 && code <= 0x0505) {
    return fmt::sprintf("GL ERROR 0x%x: %s", code, kNames[code - 0x0500]);
  }
  return fmt::sprintf("GL ERROR 0x%x: UNKNOWN", code);
}

// --- playback

void PointsDocumentGLView::invalidateTimer() {
  if (timer_) {
    runLoop_.invalidateTimer(*timer_);
    timer_.reset();
  }
}

void PointsDocumentGLView::beginAnimatingWithCameraPath(std::shared_ptr<CameraPath> path) {
  invalidateTimer();
  if (!path) {
    logf("beginAnimatingWithCameraPath: nil");
    return;
  }
  if (!std::isfinite(framesPerSecond_) || !(framesPerSecond_ > 0.0f)) {
    logf("cannot play a camera path at %g frames per second", framesPerSecond_);
    return;
  }
  setIsAnimating(true);
  setAnimframe(-1);
  cameraPath_ = std::move(path);
  setCameraMode(kCameraPathOrTrackball);
  const double seconds =
      std::min(1.0 / static_cast<double>(framesPerSecond_), kLongestFrameInterval);
  const auto interval =
      std::chrono::duration_cast<RunLoop::Clock::duration>(std::chrono::duration<double>(seconds));
  timer_ = runLoop_.scheduleTimer(interval, true, [this] { timerCallback(); });
}

void PointsDocumentGLView::timerCallback() {
  if (!cameraPath_) {
    stopAnimating();
    return;
  }
  setAnimframe(animframe_ + 1);
  cameraPath_->setCurrentFrame(animframe_);
  if (animframe_ >= cameraPath_->nFrames()) {
    if (loopAnimation_) {
      setAnimframe(-1);
    } else {
      stopAnimating();
      return;
    }
  }
  setNeedsDisplay();
}

void PointsDocumentGLView::stopAnimating() {
  invalidateTimer();
  setIsAnimating(false);
  setAnimframe(0);
  setCameraMode(kSceneCamera);
  setNeedsDisplay();
}

void PointsDocumentGLView::advanceFrameForCameraPath(std::shared_ptr<CameraPath> path) {
  invalidateTimer();
  if (isAnimating_ && cameraPath_) {
    // A path without frames wraps at once, staying at frame 0.
    const std::int32_t next = animframe_ + 1;
    setAnimframe(next >= cameraPath_->nFrames() ? 0 : next);
  } else {
    if (!path) {
      logf("advanceFrameForCameraPath: nil");
      return;
    }
    setAnimframe(0);
    setIsAnimating(true);
    cameraPath_ = std::move(path);
  }
  cameraPath_->setCurrentFrame(animframe_);
  setNeedsDisplay();
}

// --- framing

void PointsDocumentGLView::frameScene() {
  if (document_ == nullptr || !document_->sceneCamera()) {
    logf("Frame Scene: no scene camera");
    return;
  }
  std::optional<Layer::BoundingBox> total;
  for (const auto& layer : document_->layers()) {
    if (layer && layer->isVisible()) {
      addBoxToUnion(total, worldBoundingBoxOfLayer(*layer));
    }
  }
  if (!total) {
    logf("Frame Scene: no visible layer has a box");
    return;
  }
  const std::shared_ptr<Camera> camera = document_->sceneCamera();
  placeCameraUndoably(*document_, camera, framingOfBoxForCamera(*camera, *total), "Frame Scene");
  setNeedsDisplay();
}

}  // namespace cloudreel
