#include "timeline/timeline_window_controller.h"

#include <chrono>
#include <cmath>

#include "camera/scene_camera.h"
#include "platform/log.h"
#include "platform/user_interaction.h"
#include "platform/value.h"
#include "render/offline_gl_renderer.h"
#include "render/render_properties_controller.h"
#include "scene/my_document.h"
#include "timeline/edit_point.h"
#include "timeline/render_run.h"
#include "timeline/timeline.h"
#include "timeline/timeline_clip.h"
#include "timeline/timeline_track.h"

namespace cloudreel {

namespace {

// How far an Option-click looks for a control point to snap to, in seconds.
constexpr float kSnapDistance = 2.0f;

}  // namespace

TimelineWindowController::TimelineWindowController(RunLoop& runLoop)
    : runLoop_(runLoop), cursorLabel_(cursorLabelForTime(0.0f, 0)) {}

TimelineWindowController::~TimelineWindowController() {
  invalidateTimer();
  endEditing();
  if (document_ != nullptr) {
    document_->removeObserver(*this, "timeline");
  }
}

const PropertyTable& TimelineWindowController::properties() const {
  using T = TimelineWindowController;
  static const PropertyTable table(
      &Object::objectProperties(),
      {readOnlyProperty<T>("timeline", &T::timeline),
       property<T>("cursor", &T::cursor, &T::setCursor),
       property<T>("frameScale", &T::frameScale, &T::setFrameScale),
       readOnlyProperty<T>("isAnimating", &T::isAnimating),
       property<T>("selectedClip", &T::selectedClip, &T::setSelectedClip),
       property<T>("updateAllWindowsWhenRendering", &T::updateAllWindowsWhenRendering,
                   &T::setUpdateAllWindowsWhenRendering),
       readOnlyProperty<T>("routesPlaybackToDocument", &T::routesPlaybackToDocument)});
  return table;
}

// --- the document followed

std::shared_ptr<Timeline> TimelineWindowController::timeline() const {
  return document_ != nullptr ? document_->timeline() : nullptr;
}

void TimelineWindowController::setDocument(MyDocument* document) {
  if (document == document_) {
    return;
  }
  willChangeValueForKey("timeline");
  timelineWillChange();
  if (document_ != nullptr) {
    document_->removeObserver(*this, "timeline");
  }
  document_ = document;
  if (document_ != nullptr) {
    document_->addObserver(*this, "timeline", ObservingOptions::Prior, "");
  }
  didChangeValueForKey("timeline");
  updateLabel();
  refreshViews();
}

void TimelineWindowController::observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath,
                                                                           Object& object,
                                                                           const Change& change,
                                                                           std::string_view) {
  if (keyPath != "timeline" || &object != document_) {
    return;
  }
  // The edit points and the timer belong to the old timeline: they are let
  // go before it is replaced.
  if (change.isPrior) {
    willChangeValueForKey("timeline");
    timelineWillChange();
  } else {
    didChangeValueForKey("timeline");
    updateLabel();
    refreshViews();
  }
}

void TimelineWindowController::timelineWillChange() {
  stopPlayback();
  endEditing();
  setSelectedClip(nullptr);
}

// --- the cursor

void TimelineWindowController::setCursor(float t) {
  endEditing();
  storeCursor(t);
  showCursor();
  updateLabel();
}

std::string TimelineWindowController::cursorLabelForTime(float t, std::int32_t fps) {
  const auto frame = saturatingCast<std::int32_t>(static_cast<float>(fps) * t);
  return fmt::sprintf("%0.2f sec %d fr", t, frame);
}

void TimelineWindowController::moveCursor(float dt) {
  endEditing();
  const float c = cursor_ + dt;
  // A step that is not a number would leave the cursor nowhere: ignored.
  if (std::isnan(c)) {
    return;
  }
  const auto tl = timeline();
  const float length = tl ? tl->totalLengthInSeconds() : 0.0f;
  setCursor(c < 0.0f ? 0.0f : c > length ? length : c);
}

void TimelineWindowController::moveByFrames(int frames) {
  const auto tl = timeline();
  if (!tl || tl->fps() <= 0) {
    return;
  }
  moveCursor(narrowToFloat(frames / static_cast<double>(tl->fps())));
  refreshViews();
}

void TimelineWindowController::moveCursorToEdit(const TimelineClip& clip) {
  storeCursor(clip.begin());
  // The timeline is not applied here: the edit in progress observes the
  // animated properties, and applying would feed the tracks' values back
  // into the point being edited.
  if (view_ != nullptr) {
    view_->setCursorForTime(cursor_);
  }
  refreshViews();
}

void TimelineWindowController::showCursor() {
  if (view_ != nullptr) {
    view_->setCursorForTime(cursor_);
  }
  if (const auto tl = timeline()) {
    tl->applyForTime(cursor_);
  }
  if (document_ != nullptr) {
    document_->hasChanged();
  }
  refreshViews();
}

void TimelineWindowController::updateLabel() {
  const auto tl = timeline();
  cursorLabel_ = cursorLabelForTime(cursor_, tl ? tl->fps() : 0);
  if (view_ != nullptr) {
    view_->setCursorLabel(cursorLabel_);
  }
}

void TimelineWindowController::refreshViews() {
  if (view_ != nullptr) {
    view_->setNeedsDisplay();
  }
}

// --- editing control points

std::size_t TimelineWindowController::beginEditingAtCursor() {
  endEditing();
  if (const auto tl = timeline()) {
    editingClips_ = tl->editsAtTime(cursor_);
  }
  for (const auto& edit : editingClips_) {
    edit->beginEditingClip();
  }
  return editingClips_.size();
}

void TimelineWindowController::endEditing() {
  // Taken out first: committing a value may be observed by code that moves
  // the cursor, which ends editing again.
  const auto edits = std::move(editingClips_);
  editingClips_.clear();
  for (const auto& edit : edits) {
    edit->endEditingClip();
  }
}

// --- marks

void TimelineWindowController::markIn() {
  if (const auto tl = timeline()) {
    tl->setInPoint(cursor_);
    refreshViews();
  }
}

void TimelineWindowController::markOut() {
  if (const auto tl = timeline()) {
    tl->setOutPoint(cursor_);
    refreshViews();
  }
}

void TimelineWindowController::clearIn() {
  if (const auto tl = timeline()) {
    tl->setInPoint(-1.0f);
    refreshViews();
  }
}

void TimelineWindowController::clearOut() {
  if (const auto tl = timeline()) {
    tl->setOutPoint(-1.0f);
    refreshViews();
  }
}

void TimelineWindowController::goToIn() {
  if (const auto tl = timeline()) {
    setCursor(tl->inPoint());
    refreshViews();
  }
}

void TimelineWindowController::goToOut() {
  if (const auto tl = timeline()) {
    setCursor(tl->outPoint());
    refreshViews();
  }
}

bool TimelineWindowController::bothMarksSet() const {
  const auto tl = timeline();
  return tl && tl->inPoint() >= 0.0f && tl->outPoint() >= 0.0f;
}

void TimelineWindowController::cut() {
  if (!bothMarksSet()) {
    UserInteraction::shared().beep();
    return;
  }
  const auto tl = timeline();
  tl->cutFrom(tl->inPoint(), tl->outPoint());
  // The range is gone, and with it what the marks marked.
  tl->setInPoint(-1.0f);
  tl->setOutPoint(-1.0f);
  refreshViews();
}

void TimelineWindowController::lift() {
  if (!bothMarksSet()) {
    UserInteraction::shared().beep();
    return;
  }
  const auto tl = timeline();
  tl->liftFrom(tl->inPoint(), tl->outPoint());
  refreshViews();
}

// --- playback

void TimelineWindowController::playForwards() { startPlayback(Direction::Forwards); }

void TimelineWindowController::playBackwards() { startPlayback(Direction::Backwards); }

void TimelineWindowController::startPlayback(Direction direction) {
  const auto tl = timeline();
  if (!tl || tl->fps() <= 0) {
    logf("no frame rate to play at");
    return;
  }
  endEditing();
  // One timer at a time: starting either way replaces a running one.
  invalidateTimer();
  setRoutesPlaybackToDocument(!updateAllWindowsWhenRendering_);
  setIsAnimating(true);
  const auto interval = std::chrono::duration_cast<RunLoop::Clock::duration>(
      std::chrono::duration<double>(1.0 / tl->fps()));
  timer_ = runLoop_.scheduleTimer(interval, true, [this, direction] {
    if (direction == Direction::Forwards) {
      forwardStep();
    } else {
      backwardStep();
    }
  });
}

void TimelineWindowController::stopPlayback() {
  setRoutesPlaybackToDocument(false);
  if (timer_) {
    invalidateTimer();
    setIsAnimating(false);
  }
}

void TimelineWindowController::invalidateTimer() {
  if (timer_) {
    runLoop_.invalidateTimer(*timer_);
    timer_.reset();
  }
}

void TimelineWindowController::setIsAnimating(bool v) {
  if (v != isAnimating_) {
    changeValueForKey("isAnimating", isAnimating_, v);
  }
}

void TimelineWindowController::setRoutesPlaybackToDocument(bool v) {
  if (v != routesPlaybackToDocument_) {
    changeValueForKey("routesPlaybackToDocument", routesPlaybackToDocument_, v);
  }
}

// A frame is 1/fps seconds worked out in double and added to the float
// cursor, the sum rounded to float: the cursor drifts from exact multiples
// of the frame length as float sums do, and the end tests below compare
// that float. With both marks set, passing the out point loops to the in
// point and playback goes on; otherwise passing the end stops it at 0.
void TimelineWindowController::forwardStep() {
  const auto tl = timeline();
  // A timeline gone or without a frame rate has no next frame.
  if (!tl || tl->fps() <= 0) {
    stopPlayback();
    return;
  }
  const float c = narrowToFloat(static_cast<double>(cursor_) + 1.0 / tl->fps());
  if (bothMarksSet() && c > tl->outPoint()) {
    storeCursor(tl->inPoint());
  } else if (c > tl->totalLengthInSeconds()) {
    stopPlayback();
    storeCursor(0.0f);
  } else {
    storeCursor(c);
  }
  showCursor();
  updateLabel();
}

// The mirror image: going below the in point loops to the out point, and
// reaching 0 (or passing it) stops playback at 0.
void TimelineWindowController::backwardStep() {
  const auto tl = timeline();
  if (!tl || tl->fps() <= 0) {
    stopPlayback();
    return;
  }
  const float c = narrowToFloat(static_cast<double>(cursor_) - 1.0 / tl->fps());
  if (bothMarksSet() && c < tl->inPoint()) {
    storeCursor(tl->outPoint());
  } else if (c <= 0.0f) {
    stopPlayback();
    storeCursor(0.0f);
  } else {
    storeCursor(c);
  }
  showCursor();
  updateLabel();
}

// --- a click in the track area

std::optional<TimelineDrag> TimelineWindowController::mouseDown(Point2D point, const Rect2D& bounds,
                                                                float pixelsPerSecond,
                                                                TimelineMouseModifiers modifiers) {
  // A view without a time scale (not laid out yet) maps no point to a time.
  if (!(pixelsPerSecond > 0.0f)) {
    return std::nullopt;
  }
  float t = narrowToFloat(point.x / pixelsPerSecond);
  const auto tl = timeline();
  const auto track = tl ? tl->trackForCoordinates(point, bounds) : nullptr;
  const auto clip = track ? track->clipForTime(t) : nullptr;

  stopPlayback();
  setSelectedClip(clip);

  std::optional<TimelineDrag> drag;
  if (modifiers.command && clip) {
    auto element = track->controlPointForTime(t);
    if (element) {
      logf("a control point");
    } else {
      element = clip;
    }
    drag = TimelineDrag{element, track, element->copy(), point};
  }
  if (modifiers.option && tl) {
    if (const auto edit = tl->editWithin(kSnapDistance, t)) {
      t = edit->begin();
    }
  }
  setCursor(t);
  return drag;
}

std::shared_ptr<RenderRun> TimelineWindowController::renderTimeline(
    const RenderPropertiesController& settings, std::shared_ptr<RenderProgressController> progress,
    std::function<void(bool cancelled)> finished, Error* error) {
  const std::shared_ptr<Timeline> tl = timeline();
  if (document_ == nullptr || !tl) {
    return nullptr;
  }
  MyDocument& document = *document_;
  const std::optional<RenderFrameRange> range =
      renderRangeForSelection(*tl, settings.renderRangeSelected(), error);
  if (!range) {
    return nullptr;
  }
  const std::shared_ptr<SceneCamera> camera = document.sceneCamera();
  std::unique_ptr<OfflineGLRenderer> renderer;
  if (const auto context = document.sharedGLContext()) {
    renderer = OfflineGLRenderer::initWithSceneContextExportDepth(
        OpenGLScene::initWithWidthHeightFieldOfViewZNearZFar(settings.width(), settings.height(),
                                                             camera ? camera->fieldOfView() : 45.0,
                                                             settings.zNear(), settings.zFar()),
        *context, settings.shouldRenderDepth());
  }
  if (renderer) {
    renderer->setOutputPath(settings.outputPath());
    renderer->setOutputPattern(settings.outputPattern());
    renderer->setIsStereoRender(settings.renderInStereo());
    renderer->setStereoSeparation(settings.stereoSeparation());
  }
  RenderRun::Hooks hooks;
  hooks.progress = [progress](int frame, int last) {
    if (progress) {
      progress->setProgressFrameLastFrame(frame, last);
    }
  };
  hooks.hasCancelled = [progress] { return progress && progress->hasCancelled(); };
  hooks.prepareFrame = [this, tl, camera](int frame) -> std::shared_ptr<Camera> {
    setCursor(timeForRenderFrame(*tl, frame));
    return camera;
  };
  hooks.finished = std::move(finished);
  auto run = RenderRun::create(document, std::move(renderer), *range, std::move(hooks), runLoop_);
  run->start();
  return run;
}

}  // namespace cloudreel
