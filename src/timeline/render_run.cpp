#include "timeline/render_run.h"

#include "render/offline_gl_renderer.h"
#include "scene/my_document.h"
#include "timeline/timeline.h"

namespace cloudreel {

RenderFrameRange wholeTimelineRange(const Timeline& timeline) {
  return {-1, timeline.totalLengthInFrames()};
}

RenderFrameRange markedRange(const Timeline& timeline) {
  const auto fps = static_cast<float>(timeline.fps());
  return {saturatingCast<int>(fps * timeline.inPoint() - 1.0f),
          saturatingCast<int>(fps * timeline.outPoint())};
}

float timeForRenderFrame(const Timeline& timeline, int frame) {
  const std::int32_t frames = timeline.totalLengthInFrames();
  if (frames == 0) {
    return 0.0f;
  }
  return static_cast<float>(frame) / static_cast<float>(frames) * timeline.totalLengthInSeconds();
}

std::shared_ptr<RenderRun> RenderRun::create(MyDocument& document,
                                             std::unique_ptr<OfflineGLRenderer> renderer,
                                             RenderFrameRange range, Hooks hooks,
                                             RunLoop& mainLoop) {
  return std::shared_ptr<RenderRun>(
      new RenderRun(document, std::move(renderer), range, std::move(hooks), mainLoop));
}

RenderRun::RenderRun(MyDocument& document, std::unique_ptr<OfflineGLRenderer> renderer,
                     RenderFrameRange range, Hooks hooks, RunLoop& mainLoop)
    : document_(document),
      renderer_(std::move(renderer)),
      range_(range),
      hooks_(std::move(hooks)),
      mainLoop_(mainLoop),
      background_(std::make_unique<BackgroundQueue>()) {}

RenderRun::~RenderRun() = default;

void RenderRun::start() {
  if (running_) {
    return;
  }
  running_ = true;
  document_.setEnableViewUpdates(false);
  mainLoop_.post([self = shared_from_this()] { self->renderNextFrame(); });
}

void RenderRun::renderNextFrame() {
  const int previous = range_.current;
  const int frame = previous + 1;
  range_.current = frame;
  if (previous >= range_.last) {
    finish(false);
    return;
  }
  if (hooks_.hasCancelled && hooks_.hasCancelled()) {
    finish(true);
    return;
  }
  if (hooks_.shouldRenderFrame && !hooks_.shouldRenderFrame(frame)) {
    mainLoop_.post([self = shared_from_this()] { self->renderNextFrame(); });
    return;
  }
  if (hooks_.progress) {
    hooks_.progress(frame, range_.last);
  }
  std::shared_ptr<Camera> camera = hooks_.prepareFrame ? hooks_.prepareFrame(frame) : nullptr;

  struct Outcome {
    bool written = false;
    Error error;
  };
  auto outcome = std::make_shared<Outcome>();
  // The work holds no reference to the run: the completion does, so the
  // run outlives the work and is let go on the main thread, never on the
  // background thread it would have to join.
  background_->async(
      [this, frame, camera = std::move(camera), outcome] {
        if (renderer_) {
          outcome->written =
              renderer_->renderFrameOfDocumentForCamera(frame, document_, camera, &outcome->error);
        } else {
          outcome->error = Error{"Cloudreel", 100, "No renderer"};
        }
      },
      mainLoop_,
      [self = shared_from_this(), frame, outcome] {
        if (self->hooks_.frameFinished) {
          self->hooks_.frameFinished(frame, outcome->written, outcome->error);
        }
        self->renderNextFrame();
      });
}

void RenderRun::finish(bool cancelled) {
  running_ = false;
  document_.setEnableViewUpdates(true);
  // The renderer goes with its context now, not whenever the last step
  // lets go of the run. No frame is in flight: this step is the completion
  // of the last one.
  renderer_.reset();
  if (hooks_.finished) {
    hooks_.finished(cancelled);
  }
}

}  // namespace cloudreel
