#pragma once
// A render run: the frames of a range produced one after the other, the
// main thread putting the scene in the state of each frame (applying the
// timeline) and a background thread drawing it. Exactly one frame is drawn
// at a time, and only while the main thread waits for it, so the document
// is never animated while a frame is being drawn, and no lock is needed.
// A drawn frame's files are written on a thread of their own while the
// next frame is set up and drawn. The timeline window and the command
// line drive the same run; what differs (how the cursor moves, where
// progress shows, which camera looks) comes in as hooks.
//
// The document's view updates are off while the run lasts and on again at
// its end, however it ends.

#include <functional>
#include <memory>
#include <optional>

#include "platform/error.h"
#include "platform/run_loop.h"
#include "render/offline_gl_renderer.h"

namespace cloudreel {

class Camera;
class MyDocument;
class Timeline;

// The frames a run covers: current + 1 to last, inclusive.
struct RenderFrameRange {
  int current = -1;
  int last = -1;
  int firstFrame() const { return current + 1; }
  // How many frames the run draws (0 for an empty range).
  int frameCount() const { return last > current ? last - current : 0; }
};

// The whole timeline: frames 0 to totalLengthInFrames, one frame more than
// the timeline's length (the frame at its very end included). Kept so:
// renders made before match frame for frame.
RenderFrameRange wholeTimelineRange(const Timeline& timeline);
// From the mark-in to the mark-out point: truncate(fps × in - 1) + 1 to
// truncate(fps × out), in single precision, so a mark-in of 0.02 s at 25 fps
// starts at frame 1. Marks that are not set (-1) give a range starting at
// frame -25 or so; callers check the marks first.
RenderFrameRange markedRange(const Timeline& timeline);
// The range the settings sheet's selector chooses (tag 1 the whole
// timeline, any other tag the marks), checked before a render starts: the
// marked range needs both marks set and the out point not before the in
// point. Otherwise nothing, with an error the user can act on.
std::optional<RenderFrameRange> renderRangeForSelection(const Timeline& timeline, int rangeTag,
                                                        Error* error = nullptr);
// The time of frame n: n / totalLengthInFrames × totalLengthInSeconds, in
// single precision. A timeline of no frames would divide by zero; every
// frame of it is at time 0.
float timeForRenderFrame(const Timeline& timeline, int frame);

class RenderRun : public std::enable_shared_from_this<RenderRun> {
 public:
  struct Hooks {
    // Main thread, before frame n is drawn: puts the scene in that frame's
    // state and answers the camera to draw it through.
    std::function<std::shared_ptr<Camera>(int frame)> prepareFrame;
    // Main thread: false skips frame n without drawing it (a resumed render
    // whose files are there). Unset: every frame is drawn.
    std::function<bool(int frame)> shouldRenderFrame;
    // Main thread, as frame n of last starts.
    std::function<void(int frame, int last)> progress;
    // Main thread, before each frame: true ends the run there. The frame in
    // flight is always finished and written first.
    std::function<bool()> hasCancelled;
    // Main thread, after frame n was drawn and written (or not: the error
    // says why).
    std::function<void(int frame, bool written, const Error& error)> frameFinished;
    // Main thread, once, when the run is over; `cancelled` tells why.
    std::function<void(bool cancelled)> finished;
  };

  // A null renderer draws nothing: the run still walks its range and ends
  // as any run does.
  static std::shared_ptr<RenderRun> create(MyDocument& document,
                                           std::unique_ptr<OfflineGLRenderer> renderer,
                                           RenderFrameRange range, Hooks hooks,
                                           RunLoop& mainLoop = RunLoop::main());
  ~RenderRun();

  // Switches the document's view updates off and posts the first step on
  // the main loop. The run keeps itself alive until it has finished.
  void start();

  bool isRunning() const { return running_; }
  int currentRenderFrame() const { return range_.current; }
  int lastRenderFrame() const { return range_.last; }

 private:
  RenderRun(MyDocument& document, std::unique_ptr<OfflineGLRenderer> renderer,
            RenderFrameRange range, Hooks hooks, RunLoop& mainLoop);
  struct WriteResult {
    bool written = false;
    Error error;
  };
  // At most this many frames wait for or undergo writing; the next frame
  // is drawn only below it.
  static constexpr int kMostPendingWrites = 2;

  // One step on the main thread: the next frame, or the end.
  void renderNextFrame();
  // On the main thread once a frame is drawn: its files go to the writer.
  void frameDrawn(const std::shared_ptr<OfflineGLRenderer::DrawnFrame>& drawn);
  void frameWritten(int frame, const WriteResult& result);
  void finish(bool cancelled);

  MyDocument& document_;
  std::unique_ptr<OfflineGLRenderer> renderer_;
  RenderFrameRange range_;
  Hooks hooks_;
  RunLoop& mainLoop_;
  bool running_ = false;
  int pendingWrites_ = 0;
  bool waitingForWriter_ = false;
  // The range is done or cancelled, and the run ends when the last files
  // are written.
  bool ending_ = false;
  bool endCancelled_ = false;
  // Declared last: destroyed first, so their threads finish any frame still
  // queued while the renderer they use is alive.
  std::unique_ptr<BackgroundQueue> writer_;
  std::unique_ptr<BackgroundQueue> background_;
};

}  // namespace cloudreel
