#include "render/view_controls_controller.h"

#include <algorithm>
#include <array>
#include <cmath>

#include "camera/camera_path.h"
#include "camera/transform_stack.h"
#include "render/points_document_gl_view.h"
#include "scene/my_document.h"

namespace cloudreel {

namespace {

// The view properties the panel shows.
constexpr std::array<const char*, 8> kObservedKeys = {
    "viewMode",        "glassesType",   "eyeSeparation", "cameraMode",
    "framesPerSecond", "loopAnimation", "isAnimating",   "animframe"};

constexpr float kMinimumFPS = 1.0f;
constexpr float kMaximumFPS = 240.0f;

}  // namespace

ViewControlsController::ViewControlsController()
    : viewObserver_(
          [this](std::string_view, Object&, const Change&, std::string_view) { reload(); }) {}

ViewControlsController::~ViewControlsController() { stopObservingView(); }

const std::vector<std::string>& ViewControlsController::viewModeTitles() {
  static const std::vector<std::string> titles = {"Perspective", "Orthographic", "Anaglyph"};
  return titles;
}

const std::vector<std::string>& ViewControlsController::glassesTitles() {
  static const std::vector<std::string> titles = {"Red / Blue", "Red / Green", "Red / Cyan",
                                                  "Blue / Red", "Green / Red", "Cyan / Red"};
  return titles;
}

const std::vector<std::string>& ViewControlsController::cameraModeTitles() {
  static const std::vector<std::string> titles = {"Scene Camera", "Camera Path / Trackball",
                                                  "Selected Camera", "Trackball"};
  return titles;
}

void ViewControlsController::stopObservingView() {
  if (const auto view = view_.lock()) {
    for (const char* key : kObservedKeys) {
      view->removeObserver(viewObserver_, key);
    }
  }
  view_.reset();
}

void ViewControlsController::setView(const std::shared_ptr<PointsDocumentGLView>& view) {
  if (view == view_.lock()) {
    return;
  }
  stopObservingView();
  view_ = view;
  if (view) {
    for (const char* key : kObservedKeys) {
      view->addObserver(viewObserver_, key, ObservingOptions::None, "");
    }
  }
  reload();
}

void ViewControlsController::documentDidChange() {
  chosenPath_.reset();
  reload();
}

void ViewControlsController::reload() {
  if (reloadHandler_) {
    reloadHandler_();
  }
}

int ViewControlsController::viewMode() const {
  const auto view = this->view();
  return view ? view->viewMode() : PointsDocumentGLView::kNormal;
}

void ViewControlsController::setViewMode(int mode) {
  if (const auto view = this->view()) {
    view->setViewMode(mode);
  }
}

int ViewControlsController::glassesType() const {
  const auto view = this->view();
  return view ? view->glassesType() : 1;
}

void ViewControlsController::setGlassesType(int type) {
  if (const auto view = this->view()) {
    view->setGlassesType(std::clamp(type, 1, static_cast<int>(glassesTitles().size())));
  }
}

float ViewControlsController::eyeSeparation() const {
  const auto view = this->view();
  return view ? view->eyeSeparation() : 1.0f;
}

void ViewControlsController::setEyeSeparation(float separation) {
  const auto view = this->view();
  if (view && !std::isnan(separation)) {
    view->setEyeSeparation(separation);
  }
}

int ViewControlsController::cameraMode() const {
  const auto view = this->view();
  return view ? view->cameraMode() : PointsDocumentGLView::kSceneCamera;
}

void ViewControlsController::setCameraMode(int mode) {
  if (const auto view = this->view()) {
    view->setCameraMode(mode);
  }
}

float ViewControlsController::framesPerSecond() const {
  const auto view = this->view();
  return view ? view->framesPerSecond() : 0.0f;
}

void ViewControlsController::setFramesPerSecond(float fps) {
  const auto view = this->view();
  if (view && !std::isnan(fps)) {
    view->setFramesPerSecond(std::clamp(fps, kMinimumFPS, kMaximumFPS));
  }
}

bool ViewControlsController::loopAnimation() const {
  const auto view = this->view();
  return view && view->loopAnimation();
}

void ViewControlsController::setLoopAnimation(bool loop) {
  if (const auto view = this->view()) {
    view->setLoopAnimation(loop);
  }
}

std::vector<std::shared_ptr<CameraPath>> ViewControlsController::playablePaths() const {
  std::vector<std::shared_ptr<CameraPath>> paths;
  const auto document = this->document();
  if (!document) {
    return paths;
  }
  paths = document->cameraPaths();
  const auto addOnce = [&paths](const std::shared_ptr<CameraPath>& path) {
    if (path && std::find(paths.begin(), paths.end(), path) == paths.end()) {
      paths.push_back(path);
    }
  };
  for (const auto& path : document->storedCameraPaths()) {
    addOnce(path);
  }
  for (const auto& stack : document->transformStacks()) {
    addOnce(stack);
  }
  return paths;
}

std::vector<std::string> ViewControlsController::playablePathTitles() const {
  std::vector<std::string> titles;
  for (const auto& path : playablePaths()) {
    titles.push_back(path->name());
  }
  return titles;
}

std::optional<std::size_t> ViewControlsController::selectedPathIndex() const {
  const auto paths = playablePaths();
  if (paths.empty()) {
    return std::nullopt;
  }
  const auto chosen = chosenPath_.lock();
  const auto found = std::find(paths.begin(), paths.end(), chosen);
  return found != paths.end() ? static_cast<std::size_t>(found - paths.begin()) : 0;
}

void ViewControlsController::selectPath(std::size_t index) {
  const auto paths = playablePaths();
  if (index < paths.size()) {
    chosenPath_ = paths[index];
    reload();
  }
}

std::shared_ptr<CameraPath> ViewControlsController::selectedPath() const {
  const auto index = selectedPathIndex();
  return index ? playablePaths()[*index] : nullptr;
}

bool ViewControlsController::isPlaying() const {
  const auto view = this->view();
  return view && view->isAnimating();
}

int ViewControlsController::animframe() const {
  const auto view = this->view();
  return view ? view->animframe() : 0;
}

void ViewControlsController::play() {
  const auto view = this->view();
  const auto path = selectedPath();
  if (view && path) {
    view->beginAnimatingWithCameraPath(path);
  }
}

void ViewControlsController::stop() {
  if (const auto view = this->view()) {
    view->stopAnimating();
  }
}

void ViewControlsController::step() {
  const auto view = this->view();
  const auto path = selectedPath();
  if (view && path) {
    view->advanceFrameForCameraPath(path);
  }
}

bool ViewControlsController::selectPathForRender() {
  const auto document = this->document();
  const auto path = selectedPath();
  if (!document || !path) {
    return false;
  }
  document->setSelectedLayer(path);
  return true;
}

}  // namespace cloudreel
