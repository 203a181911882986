#include "timeline/render_run.h"

#include "render/offline_gl_renderer.h"
#include "render/render_properties_controller.h"
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

std::optional<RenderFrameRange> renderRangeForSelection(const Timeline& timeline, int rangeTag,
                                                        Error* error) {
  if (rangeTag == static_cast<int>(RenderRange::WholeTimeline)) {
    return wholeTimelineRange(timeline);
  }
  const auto refuse = [error](std::string message) -> std::optional<RenderFrameRange> {
    setError(error, "Render", 1, std::move(message));
    return std::nullopt;
  };
  // An unset mark is -1; one that is not a number fails the test as well.
  if (!(timeline.inPoint() >= 0.0f) || !(timeline.outPoint() >= 0.0f)) {
    return refuse(
        "The marked range cannot be rendered: set both the in and the out mark, or render the "
        "whole timeline.");
  }
  if (timeline.outPoint() < timeline.inPoint()) {
    return refuse("The marked range cannot be rendered: the out mark lies before the in mark.");
  }
  return markedRange(timeline);
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
      writer_(std::make_unique<BackgroundQueue>()),
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

  auto drawn = std::make_shared<OfflineGLRenderer::DrawnFrame>();
  // The work holds no reference to the run: the completion does, so the
  // run outlives the work and is let go on the main thread, never on a
  // background thread it would have to join.
  background_->async(
      [this, frame, camera = std::move(camera), drawn] {
        if (renderer_) {
          *drawn = renderer_->drawFrameOfDocumentForCamera(frame, document_, camera);
        } else {
          drawn->frame = frame;
          drawn->failed = true;
          drawn->error = Error{"Cloudreel", 100, "No renderer"};
        }
      },
      mainLoop_, [self = shared_from_this(), drawn] { self->frameDrawn(drawn); });
}

void RenderRun::frameDrawn(const std::shared_ptr<OfflineGLRenderer::DrawnFrame>& drawn) {
  // The frame's files are written on their own thread while the next frame
  // is set up and drawn; the frame after that waits for the writer, so at
  // most two frames' images are held.
  ++pendingWrites_;
  auto result = std::make_shared<WriteResult>();
  writer_->async(
      [this, drawn, result] {
        if (renderer_) {
          result->written = renderer_->writeDrawnFrame(*drawn, &result->error);
        } else {
          result->error = drawn->error;
        }
      },
      mainLoop_,
      [self = shared_from_this(), frame = drawn->frame, result] {
        self->frameWritten(frame, *result);
      });
  if (pendingWrites_ < kMostPendingWrites) {
    renderNextFrame();
  } else {
    waitingForWriter_ = true;
  }
}

void RenderRun::frameWritten(int frame, const WriteResult& result) {
  --pendingWrites_;
  if (hooks_.frameFinished) {
    hooks_.frameFinished(frame, result.written, result.error);
  }
  if (waitingForWriter_) {
    waitingForWriter_ = false;
    renderNextFrame();
  } else if (ending_ && pendingWrites_ == 0) {
    finish(endCancelled_);
  }
}

void RenderRun::finish(bool cancelled) {
  // Frames still being written are part of the run: it ends after them.
  if (pendingWrites_ > 0) {
    ending_ = true;
    endCancelled_ = cancelled;
    return;
  }
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
