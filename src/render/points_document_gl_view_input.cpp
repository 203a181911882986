// What the document view does with keys, mouse drags and gestures.
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

// --- keys

void PointsDocumentGLView::keyDown(std::string_view characters, bool isRepeat) {
  if (isRepeat) {
    return;
  }
  const char key = characters.empty() ? '\0' : characters.front();
  const bool navigating = editMode_ == kNoEditing;
  auto& t = keyboardTranslation_;
  switch (key) {
    case 'a':
      if (navigating) t[0] += 0.5;
      break;
    case 'd':
      if (navigating) t[0] -= 0.5;
      break;
    case 'c':
      if (navigating) t[1] += 0.5;
      break;
    case 'w':
      if (navigating) t[2] += 0.5;
      break;
    case 's':
      if (navigating) t[2] -= 0.5;
      break;
    case 'z':
      if (navigating) t = {0.0, 0.0, 0.0};
      break;
    case 'q':
      setEditMode(kNoEditing);
      break;
    case '~':
      if (editMode_ != kNoEditing) {
        setEditMode(kNoEditing);
      }
      setViewMode(kNormal);
      break;
    case ' ':
      if (viewMode_ == kOrthographic) {
        setIsPanningKeyDown(true);
      }
      break;
    case '1':
      cameraPreset(0);
      break;
    case '2':
      cameraPreset(1);
      break;
    case '3':
      cameraPreset(2);
      break;
    case '!':
      cameraPreset(3);
      break;
    case '@':
      cameraPreset(4);
      break;
    case '#':
      cameraPreset(5);
      break;
    case '+':
    case '=':
      zoomIn();
      break;
    case '-':
      zoomOut();
      break;
    default:
      break;
  }
  setNeedsDisplay();
  if (document_ != nullptr) {
    document_->hasChanged();
  }
}

void PointsDocumentGLView::keyUp(std::string_view characters) {
  if (!characters.empty() && characters.front() == ' ') {
    setIsPanningKeyDown(false);
  }
}

// --- mouse

void PointsDocumentGLView::mouseDown(Point2D point, ViewModifiers modifiers) {
  mouseDownModifiers_ = modifiers;
  dragStart_ = point;
  dragLast_ = point;
  dragMoved_ = false;
  if (isPanningKeyDown_) {
    setIsPanning(true);
    drag_ = DragKind::Pan;
  } else if (viewMode_ != kOrthographic) {
    setIsPanning(false);
    trackball_->beginTrackballAtPointForScene(point.x, point.y, glScene_);
    drag_ = DragKind::Trackball;
  } else {
    drag_ = DragKind::Orthographic;
  }
}

void PointsDocumentGLView::mouseDragged(Point2D point) {
  switch (drag_) {
    case DragKind::Trackball:
      trackball_->rollToTrackball(point.x, point.y);
      break;
    case DragKind::Pan:
      panDrag(point);
      break;
    case DragKind::Orthographic:
      // Editing moves the layer; otherwise the drag moves the view.
      if (editingLayer()) {
        editDrag(point);
      } else {
        panDrag(point);
      }
      break;
    case DragKind::Dolly:
    case DragKind::None:
      break;
  }
  dragLast_ = point;
  setNeedsDisplay();
}

void PointsDocumentGLView::mouseUp(Point2D point) {
  mouseDragged(point);
  switch (drag_) {
    case DragKind::Trackball:
      trackball_->addRotationToTrackball();
      break;
    case DragKind::Pan:
      setIsPanning(false);
      break;
    case DragKind::Orthographic:
      finishOrthographicDrag();
      break;
    case DragKind::Dolly:
    case DragKind::None:
      break;
  }
  drag_ = DragKind::None;
  setNeedsDisplay();
}

void PointsDocumentGLView::panDrag(Point2D point) {
  // The scene follows the pointer: the pan is in the view's own axes.
  const double unit = worldUnitsPerPixel();
  orthoPan_[0] += (point.x - dragLast_.x) * unit;
  orthoPan_[1] += (point.y - dragLast_.y) * unit;
}

void PointsDocumentGLView::editDrag(Point2D point) {
  const auto layer = editingLayer();
  if (!layer) {
    return;
  }
  // The whole drag, from its start, replaces the pending edit each time.
  const double unit = worldUnitsPerPixel();
  const Vec3 inView{(point.x - dragStart_.x) * unit, (point.y - dragStart_.y) * unit, 0.0};
  const Vec3 world = inverseRotated(inView, orthoRotation_);
  const auto placement = placementOf(*layer);
  const ViewModifiers& m = mouseDownModifiers_;
  if (m.shift && m.command) {
    // Re-origin: the origin moves with the pointer, the content stays. A
    // placement without an inverse cannot say where that is: no change.
    if (const auto local = solveLinear(*placement, world)) {
      layer->setEditingTransform(AffineTransform::initWithTranslation(world));
      layer->setEditingOrigin(
          AffineTransform::initWithTranslation({-(*local)[0], -(*local)[1], -(*local)[2]}));
    }
  } else if (m.command) {
    // Rotate about the viewing axis, half a degree a pixel sideways.
    const double degrees = (point.x - dragStart_.x) * 0.5;
    const Vec3 axisWorld = inverseRotated({0.0, 0.0, 1.0}, orthoRotation_);
    const auto axis = solveLinear(*placement, axisWorld);
    const double len = axis ? std::hypot((*axis)[0], (*axis)[1], (*axis)[2]) : 0.0;
    if (len > 0 && std::isfinite(len)) {
      layer->setEditingOrigin(AffineTransform::initWithAxisAngleRotation(
          {degrees * kRadiansPerDegree, (*axis)[0] / len, (*axis)[1] / len, (*axis)[2] / len}));
    }
  } else if (m.shift) {
    // Scale: a drag up the view's shorter side doubles the size twice.
    const double s = glScene_.smallerDimension();
    const double factor =
        s > 0 ? std::exp2(std::clamp(2.0 * (point.y - dragStart_.y) / s, -30.0, 30.0)) : 1.0;
    layer->setEditingOrigin(AffineTransform::initWithScale(factor));
  } else {
    layer->setEditingTransform(AffineTransform::initWithTranslation(world));
  }
  dragMoved_ = dragMoved_ || point.x != dragStart_.x || point.y != dragStart_.y;
}

void PointsDocumentGLView::finishOrthographicDrag() {
  const auto layer = editingLayer();
  if (!layer) {
    return;
  }
  if (!dragMoved_) {
    // A click edits nothing, and leaves no empty undo step.
    layer->setEditingTransform(nullptr);
    layer->setEditingOrigin(nullptr);
    return;
  }
  const ViewModifiers& m = mouseDownModifiers_;
  const char* name = m.shift && m.command ? "Re-Origin"
                     : m.command          ? "Rotate"
                     : m.shift            ? "Scale"
                                          : "Translate";
  layer->applyEditingTransformNamed(name);
  if (document_ != nullptr) {
    document_->hasChanged();
  }
}

void PointsDocumentGLView::rightMouseDown(Point2D point) {
  setIsPanning(false);
  dragStart_ = point;
  dragLast_ = point;
  dragStartOrthoScale_ = orthoScale_;
  drag_ = DragKind::Dolly;
}

void PointsDocumentGLView::rightMouseDragged(Point2D point) {
  if (drag_ != DragKind::Dolly) {
    return;
  }
  dollyDrag(point);
  setNeedsDisplay();
}

void PointsDocumentGLView::rightMouseUp(Point2D point) {
  if (drag_ != DragKind::Dolly) {
    return;
  }
  dollyDrag(point);
  drag_ = DragKind::None;
  setNeedsDisplay();
}

std::shared_ptr<Camera> PointsDocumentGLView::navigableCamera() const {
  const auto camera = currentCamera();
  if (camera == trackball_) {
    return camera;
  }
  if (document_ != nullptr && camera && camera == document_->sceneCamera()) {
    return camera;
  }
  return nullptr;
}

void PointsDocumentGLView::dollyDrag(Point2D point) {
  const double s = glScene_.smallerDimension();
  if (!(s > 0)) {
    return;
  }
  if (viewMode_ == kOrthographic) {
    // Up zooms in: a drag across the shorter side doubles the scale twice.
    setOrthoScale(dragStartOrthoScale_ + static_cast<float>(2.0 * (point.y - dragStart_.y) / s));
  } else if (const auto camera = navigableCamera()) {
    // Up moves the camera forwards along its view.
    const double distance = (point.y - dragLast_.y) * 2.0 / s * kDollyUnitsPerView;
    Vec3 forward{0.0, 0.0, -1.0};
    if (camera != trackball_) {
      // A camera looks down its local -z: in the world, minus the third
      // column of its orientation. The trackball keeps its position in its
      // own turned frame, where forwards is -z.
      const auto& m = camera->inertialToObject()->mx();
      const double len = std::hypot(m[8], m[9], m[10]);
      if (len > 0 && std::isfinite(len)) {
        forward = {-m[8] / len, -m[9] / len, -m[10] / len};
      }
    }
    Vec3 position{};
    camera->objectToWorld()->getTranslation(position);
    for (std::size_t i = 0; i < 3; ++i) {
      position[i] += forward[i] * distance;
    }
    camera->setTranslate(Vector3(position));
  }
  dragLast_ = point;
}

// --- gestures

void PointsDocumentGLView::magnify(double magnification, ViewModifiers modifiers) {
  if (modifiers.command || !std::isfinite(magnification)) {
    return;
  }
  if (viewMode_ == kNormal) {
    if (document_ != nullptr && document_->sceneCamera()) {
      const auto& camera = document_->sceneCamera();
      const double fov = camera->fieldOfView() + magnification * 20.0;
      camera->setFieldOfView(static_cast<float>(std::clamp(
          fov, static_cast<double>(kMinFieldOfView), static_cast<double>(kMaxFieldOfView))));
    }
  } else if (viewMode_ == kOrthographic) {
    if (const auto layer = editingLayer()) {
      gestureScale_ += static_cast<float>(magnification);
      if (gestureScale_ > 0.0f) {
        layer->setEditingOrigin(AffineTransform::initWithScale(gestureScale_));
        gestureEdited_ = true;
      }
    } else {
      setOrthoScale(orthoScale_ + static_cast<float>(magnification));
    }
  }
  setNeedsDisplay();
}

void PointsDocumentGLView::rotateGesture(double degrees, ViewModifiers modifiers) {
  const auto layer = editingLayer();
  if (!layer || !modifiers.command || !std::isfinite(degrees)) {
    return;
  }
  gestureRotation_ += static_cast<float>(degrees * (-std::numbers::pi / 180.0));
  // About the world axis the orthographic view looks along.
  AxisAngle rotation{gestureRotation_, 0.0, 0.0, 0.0};
  rotation[static_cast<std::size_t>(1 + orthoAxis_ % 3)] = 1.0;
  layer->setEditingOrigin(AffineTransform::initWithAxisAngleRotation(rotation));
  gestureEdited_ = true;
  setNeedsDisplay();
}

void PointsDocumentGLView::endGesture() {
  if (const auto layer = editingLayer(); layer && gestureEdited_) {
    layer->applyEditingTransformNamed("trackpad gesture");
    if (document_ != nullptr) {
      document_->hasChanged();
    }
  }
  gestureScale_ = 1.0f;
  gestureRotation_ = 0.0f;
  gestureEdited_ = false;
  setNeedsDisplay();
}

void PointsDocumentGLView::scrollWheel(double lines, ViewModifiers modifiers) {
  magnify(lines * kWheelStep, modifiers);
}

}  // namespace cloudreel
