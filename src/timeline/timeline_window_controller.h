#pragma once
// The timeline panel's commands, free of any toolkit: the time cursor over
// the active document's timeline, the in and out marks with cut and lift,
// playback forwards and backwards on run-loop timers, and what a click in
// the track area means. The window is a thin shell: it forwards its buttons
// and clicks here and implements TimelineViewDelegate to place its drawn
// cursor, show the cursor label and repaint.
//
// Moving the cursor always shows the animation there: the timeline is
// applied at the new time and the document told it has changed.

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/error.h"
#include "platform/object.h"
#include "platform/plane.h"
#include "platform/run_loop.h"

namespace cloudreel {

class EditPoint;
class MyDocument;
class RenderProgressController;
class RenderPropertiesController;
class RenderRun;
class Timeline;
class TimelineClip;
class TimelineTrack;

// What the controller asks of the timeline window.
class TimelineViewDelegate {
 public:
  virtual ~TimelineViewDelegate() = default;
  // Places the drawn cursor at t seconds (x = pixels per second × t).
  virtual void setCursorForTime(float t) = 0;
  virtual void setCursorLabel(std::string_view text) = 0;
  virtual void setNeedsDisplay() = 0;
};

// The keys held during a click in the track area.
struct TimelineMouseModifiers {
  bool command = false;  // prepares a drag of the clip or control point clicked
  bool option = false;   // snaps the cursor to a control point within 2 s
};

// A drag prepared by a Command-click: the view keeps it until the mouse is
// released.
struct TimelineDrag {
  // The control point of the track at the clicked time where there is one,
  // else the clip clicked.
  std::shared_ptr<TimelineClip> element;
  std::shared_ptr<TimelineTrack> track;
  // A copy of the element as it was when the drag began.
  std::shared_ptr<TimelineClip> original;
  Point2D start;
};

class TimelineWindowController : public Object, public Observer {
 public:
  // The loop runs the playback timers: the main loop in the application,
  // the test's own in tests. It must outlive the controller.
  explicit TimelineWindowController(RunLoop& runLoop = RunLoop::main());
  // Stops playback and ends any edit.
  ~TimelineWindowController() override;

  std::string_view className() const override { return "TimelineWindowController"; }
  const PropertyTable& properties() const override;

  // --- the document followed
  // Not owned: the front end sets the active document here and sets null
  // before that document goes. Changing it (or the document changing its
  // timeline) stops playback, ends editing, drops the selected clip and
  // announces "timeline".
  MyDocument* document() const { return document_; }
  void setDocument(MyDocument* document);
  // The document's timeline; null without a document or timeline.
  std::shared_ptr<Timeline> timeline() const;
  // Not owned; null for none (then nothing is drawn).
  void setViewDelegate(TimelineViewDelegate* delegate) { view_ = delegate; }

  // --- properties
  float cursor() const { return cursor_; }
  // Frames per pixel of the drawn time axis; the ruler reads it.
  float frameScale() const { return frameScale_; }
  void setFrameScale(float v) { changeValueForKey("frameScale", frameScale_, v); }
  bool isAnimating() const { return isAnimating_; }
  const std::shared_ptr<TimelineClip>& selectedClip() const { return selectedClip_; }
  void setSelectedClip(std::shared_ptr<TimelineClip> clip) {
    changeValueForKey("selectedClip", selectedClip_, std::move(clip));
  }
  const std::vector<std::shared_ptr<EditPoint>>& editingClips() const { return editingClips_; }
  // When false (the default), playback redraws only the document's playback
  // view rather than every window showing the document.
  bool updateAllWindowsWhenRendering() const { return updateAllWindowsWhenRendering_; }
  void setUpdateAllWindowsWhenRendering(bool v) {
    changeValueForKey("updateAllWindowsWhenRendering", updateAllWindowsWhenRendering_, v);
  }
  // True from the start of playback (unless every window is to update)
  // until it stops. The document window observes it and, while it is true,
  // makes its view the document's playback view (MyDocument::setPlaybackView)
  // so that only that view redraws at each frame.
  bool routesPlaybackToDocument() const { return routesPlaybackToDocument_; }

  // --- the cursor
  // Ends editing, stores and announces t, then shows the animation at t and
  // sets the label.
  void setCursor(float t);
  // "%0.2f sec %d fr": the frame is fps × t (in float) truncated toward
  // zero; a time that is not a number gives frame 0, and frames beyond the
  // 32-bit range saturate.
  static std::string cursorLabelForTime(float t, std::int32_t fps);
  // The label's text as last set by setCursor or a playback step.
  const std::string& cursorLabel() const { return cursorLabel_; }
  // Ends editing and moves the cursor by dt, held within 0 and the
  // timeline's length.
  void moveCursor(float dt);
  // By ±1 and ±10 frames. Without a positive frame rate there is no frame
  // length, and they do nothing.
  void nextFrame() { moveByFrames(1); }
  void previousFrame() { moveByFrames(-1); }
  void nextTenFrames() { moveByFrames(10); }
  void previousTenFrames() { moveByFrames(-10); }
  // The cursor goes to the clip's begin and the drawn cursor follows; the
  // edit in progress, the scene and the label stay as they are.
  void moveCursorToEdit(const TimelineClip& clip);

  // --- editing control points
  // Ends any edit, then starts one on every track's control point at the
  // cursor; answers how many. Changes of the animated properties are
  // taken into those points until the edit ends.
  std::size_t beginEditingAtCursor();
  // Each edit point commits its value into the spans beside it; the list
  // is then empty.
  void endEditing();

  // --- marks
  void markIn();
  void markOut();
  void clearIn();
  void clearOut();
  // An unset mark (-1) moves the cursor to -1 s: the tracks show their
  // values before the first span.
  void goToIn();
  void goToOut();
  // Cut takes the marked range out of the tracks selected for editing,
  // closing the gap, and clears both marks; lift leaves the gap and the
  // marks. Unless both marks are set (>= 0) they beep and change nothing.
  void cut();
  void lift();

  // --- playback: one repeating timer of 1/fps seconds. Without a timeline
  // or a positive frame rate there is no frame interval, and nothing starts.
  void playForwards();
  void playBackwards();
  void stopPlayback();
  // One tick of the timer in each direction (see the .cpp for the loop over
  // the marks and where playback stops).
  void forwardStep();
  void backwardStep();

  // --- rendering the timeline to files
  // Renders the document's timeline through its scene camera with the
  // settings sheet's values: the whole timeline or the marked range, each
  // frame's time set through setCursor on the main thread before the frame
  // is drawn. The progress sheet shows each frame, its cancel ends the run
  // before the next frame, and `finished` is called once at the end. A
  // renderer that cannot be made draws nothing, and the run still walks its
  // range. Answers the run; null without a document, and null with the
  // reason in `error` when the marked range is chosen but cannot be
  // rendered (see renderRangeForSelection).
  std::shared_ptr<RenderRun> renderTimeline(const RenderPropertiesController& settings,
                                            std::shared_ptr<RenderProgressController> progress,
                                            std::function<void(bool cancelled)> finished = {},
                                            Error* error = nullptr);

  // --- a click in the track area. The point is in the view's coordinates;
  // the time is x / pixelsPerSecond, and the track is the timeline's row
  // under the point in the given bounds. Stops playback, selects the clip
  // clicked (or none) and moves the cursor there. Answers the drag a
  // Command-click on a clip prepares.
  std::optional<TimelineDrag> mouseDown(Point2D point, const Rect2D& bounds, float pixelsPerSecond,
                                        TimelineMouseModifiers modifiers);

  // Follows the document's "timeline".
  void observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath, Object& object,
                                                   const Change& change,
                                                   std::string_view context) override;

 private:
  enum class Direction { Forwards, Backwards };
  void startPlayback(Direction direction);
  void invalidateTimer();
  void setIsAnimating(bool v);
  void setRoutesPlaybackToDocument(bool v);
  void storeCursor(float t) { changeValueForKey("cursor", cursor_, t); }
  void moveByFrames(int frames);
  // Places the drawn cursor, applies the timeline at the cursor, tells the
  // document and repaints.
  void showCursor();
  void updateLabel();
  void refreshViews();
  void timelineWillChange();
  bool bothMarksSet() const;

  RunLoop& runLoop_;
  MyDocument* document_ = nullptr;
  TimelineViewDelegate* view_ = nullptr;
  float cursor_ = 0.0f;
  float frameScale_ = 1.0f;
  bool isAnimating_ = false;
  std::shared_ptr<TimelineClip> selectedClip_;
  std::vector<std::shared_ptr<EditPoint>> editingClips_;
  std::optional<RunLoop::TimerId> timer_;
  bool updateAllWindowsWhenRendering_ = false;
  bool routesPlaybackToDocument_ = false;
  std::string cursorLabel_;
};

}  // namespace cloudreel
