// The timeline window's commands on a real document: the cursor showing the
// animation of a sphere's size, the frame buttons, marks with cut and lift,
// playback stepping and looping, timers on a run loop, and clicks.
#include "timeline/timeline_window_controller.h"

#include <gtest/gtest.h>

#include "platform/user_interaction.h"
#include "scene/my_document.h"
#include "scene/sphere.h"
#include "support/scripted_user_interaction.h"
#include "timeline/edit_point.h"
#include "timeline/float_clips.h"
#include "timeline/float_value_track.h"
#include "timeline/timeline.h"

namespace cloudreel {
namespace {

using namespace std::chrono_literals;

struct RecordingView : TimelineViewDelegate, DocumentView {
  void setCursorForTime(float t) override { placedAt.push_back(t); }
  void setCursorLabel(std::string_view text) override { label = text; }
  void setNeedsDisplay() override { ++redraws; }
  std::vector<float> placedAt;
  std::string label;
  int redraws = 0;
};

// A document whose timeline ramps a sphere's size from 0 at 0 s to 10 at
// 4 s, the track selected for editing; the controller follows it.
class TimelineWindowControllerTest : public ::testing::Test {
 protected:
  TimelineWindowControllerTest() {
    track->justAddClip(SingleValueClip::controlPointWithTime(0.0f, 0.0f));
    track->justAddClip(std::make_shared<AnimatedValueClip>(0.0f, 4.0f, 0.0f, 10.0f));
    track->justAddClip(SingleValueClip::controlPointWithTime(4.0f, 10.0f));
    track->setIsSelectedForEditing(true);
    timeline().addTrack(track);
    document.addView(documentView);
    controller.setDocument(&document);
    controller.setViewDelegate(&view);
    previousUI = UserInteraction::setShared(ui);
  }
  ~TimelineWindowControllerTest() override {
    UserInteraction::setShared(previousUI);
    document.removeView(documentView);
  }
  Timeline& timeline() { return *document.timeline(); }

  MyDocument document;
  std::shared_ptr<Sphere> sphere = std::make_shared<Sphere>();
  std::shared_ptr<FloatValueTrack> track =
      std::make_shared<FloatValueTrack>(sphere, "size", "Size");
  RunLoop loop;
  TimelineWindowController controller{loop};
  RecordingView view;
  RecordingView documentView;
  std::shared_ptr<testing::ScriptedUserInteraction> ui =
      std::make_shared<testing::ScriptedUserInteraction>();
  std::shared_ptr<UserInteraction> previousUI;
};

TEST_F(TimelineWindowControllerTest, MovingTheCursorShowsTheAnimationThereAndLabelsIt) {
  int announced = 0;
  CallbackObserver cursorObserver([&](auto&&...) { ++announced; });
  controller.addObserver(cursorObserver, "cursor", ObservingOptions::New, "");

  controller.setCursor(1.5f);
  EXPECT_FLOAT_EQ(sphere->size(), 3.75f);
  EXPECT_EQ(view.placedAt, std::vector<float>{1.5f});
  EXPECT_EQ(view.label, "1.50 sec 37 fr");
  EXPECT_GT(documentView.redraws, 0) << "the document was told it changed";
  EXPECT_EQ(announced, 1);

  struct Case {
    float t;
    std::int32_t fps;
    const char* label;
  };
  for (const Case& c :
       {Case{0.07f, 25, "0.07 sec 1 fr"}, Case{-1.0f, 25, "-1.00 sec -25 fr"},
        Case{2.0f, 0, "2.00 sec 0 fr"}, Case{1e10f, 25, "10000000000.00 sec 2147483647 fr"}}) {
    EXPECT_EQ(TimelineWindowController::cursorLabelForTime(c.t, c.fps), c.label);
  }
}

TEST_F(TimelineWindowControllerTest, FrameButtonsMoveWithinTheTimeline) {
  struct Case {
    float from;
    void (TimelineWindowController::*button)();
    float to;
  };
  using T = TimelineWindowController;
  for (const Case& c :
       {Case{0.2f, &T::previousTenFrames, 0.0f}, Case{3.9f, &T::nextTenFrames, 4.0f},
        Case{1.0f, &T::nextFrame, 1.04f}, Case{1.0f, &T::previousFrame, 0.96f},
        Case{1.0f, &T::nextTenFrames, 1.4f}}) {
    controller.setCursor(c.from);
    (controller.*c.button)();
    EXPECT_FLOAT_EQ(controller.cursor(), c.to) << "from " << c.from;
  }
  controller.moveCursor(-10.0f / 25);
  EXPECT_FLOAT_EQ(controller.cursor(), 1.0f);

  // Without a frame rate there is no frame to move by.
  timeline().setFps(0);
  controller.nextFrame();
  EXPECT_FLOAT_EQ(controller.cursor(), 1.0f);
  EXPECT_EQ(view.label, "1.00 sec 25 fr") << "the label is left as it was";
}

TEST_F(TimelineWindowControllerTest, ForwardPlaybackStopsPastTheEndAndLoopsOverTheMarks) {
  timeline().removeTrack(*track);  // the ruler alone: one second
  controller.playForwards();
  EXPECT_TRUE(controller.isAnimating());
  EXPECT_TRUE(controller.routesPlaybackToDocument());
  float last = 0.0f;
  for (int i = 0; i < 100 && controller.isAnimating(); ++i) {
    last = controller.cursor();
    controller.forwardStep();
  }
  EXPECT_FALSE(controller.isAnimating());
  EXPECT_FALSE(controller.routesPlaybackToDocument());
  EXPECT_EQ(controller.cursor(), 0.0f);
  EXPECT_LE(last, 1.0f);
  EXPECT_GT(last + 1.0 / 25, 1.0) << "stopped on the first step that would pass the end";

  timeline().addTrack(track);
  timeline().setInPoint(2.0f);
  timeline().setOutPoint(3.0f);
  controller.setUpdateAllWindowsWhenRendering(true);
  controller.setCursor(2.98f);
  controller.playForwards();
  EXPECT_FALSE(controller.routesPlaybackToDocument());
  controller.forwardStep();
  EXPECT_EQ(controller.cursor(), 2.0f);
  EXPECT_FLOAT_EQ(sphere->size(), 5.0f);
  EXPECT_TRUE(controller.isAnimating()) << "looping does not stop";

  timeline().setFps(0);
  controller.forwardStep();
  EXPECT_FALSE(controller.isAnimating()) << "no frame rate, no next frame";
  controller.playForwards();
  EXPECT_FALSE(controller.isAnimating());
}

TEST_F(TimelineWindowControllerTest, BackwardPlaybackStopsAtZeroAndLoopsOverTheMarks) {
  controller.setCursor(0.1f);
  controller.playBackwards();
  std::vector<float> seen;
  while (controller.isAnimating() && seen.size() < 10) {
    controller.backwardStep();
    seen.push_back(controller.cursor());
  }
  ASSERT_EQ(seen.size(), 3u);
  EXPECT_NEAR(seen[0], 0.06f, 1e-6f);
  EXPECT_NEAR(seen[1], 0.02f, 1e-6f);
  EXPECT_EQ(seen[2], 0.0f);

  timeline().setInPoint(2.0f);
  timeline().setOutPoint(3.0f);
  controller.setCursor(2.02f);
  controller.playBackwards();
  controller.backwardStep();
  EXPECT_EQ(controller.cursor(), 3.0f);
  EXPECT_FLOAT_EQ(sphere->size(), 7.5f);
  EXPECT_TRUE(controller.isAnimating());
}

// At 4 fps the frame times are exact: forwards, the end itself is still
// played; backwards, reaching 0 stops.
TEST_F(TimelineWindowControllerTest, PlaybackStopsOnlyPastTheEndButAtZero) {
  timeline().removeTrack(*track);
  timeline().setFps(4);
  const auto play = [&](void (TimelineWindowController::*step)()) {
    controller.setCursor(0.5f);
    controller.playForwards();
    std::vector<std::pair<float, bool>> steps;
    while (controller.isAnimating() && steps.size() < 10) {
      (controller.*step)();
      steps.emplace_back(controller.cursor(), controller.isAnimating());
    }
    return steps;
  };
  using Steps = std::vector<std::pair<float, bool>>;
  EXPECT_EQ(play(&TimelineWindowController::forwardStep),
            (Steps{{0.75f, true}, {1.0f, true}, {0.0f, false}}));
  EXPECT_EQ(play(&TimelineWindowController::backwardStep), (Steps{{0.25f, true}, {0.0f, false}}));
}

TEST_F(TimelineWindowControllerTest, TimersDrivePlaybackOnTheRunLoop) {
  timeline().setFps(200);
  std::vector<float> cursors;
  CallbackObserver observer([&](auto&&...) { cursors.push_back(controller.cursor()); });
  controller.addObserver(observer, "cursor", ObservingOptions::New, "");

  controller.setCursor(3.9f);
  controller.playForwards();
  ASSERT_TRUE(loop.runUntil([&] { return !controller.isAnimating(); }, 10s));
  EXPECT_EQ(controller.cursor(), 0.0f);
  ASSERT_GT(cursors.size(), 3u);
  EXPECT_GT(cursors[cursors.size() - 2], 3.99f) << "played up to the end";

  // Starting backwards replaces the forward timer: the cursor only falls.
  controller.setCursor(0.1f);
  controller.playForwards();
  controller.playBackwards();
  cursors.clear();
  ASSERT_TRUE(loop.runUntil([&] { return !controller.isAnimating(); }, 10s));
  ASSERT_GT(cursors.size(), 2u);
  for (std::size_t i = 1; i < cursors.size(); ++i) {
    EXPECT_LT(cursors[i], cursors[i - 1]);
  }
  EXPECT_EQ(sphere->size(), 0.0f);
}

TEST_F(TimelineWindowControllerTest, CutAndLiftTheMarkedRangeOfTheSelectedTracks) {
  auto other = std::make_shared<FloatValueTrack>(sphere, "size", "Size");
  other->addDefaultClipAtTime(0.0f, 4.0f);
  timeline().addTrack(other);

  controller.setCursor(1.0f);
  controller.markIn();
  controller.cut();
  EXPECT_EQ(ui->beeps, 1);
  EXPECT_EQ(timeline().inPoint(), 1.0f);
  EXPECT_EQ(timeline().outPoint(), -1.0f);
  EXPECT_EQ(track->sequencedClips().size(), 3u);

  controller.setCursor(2.0f);
  controller.markOut();
  controller.lift();
  EXPECT_TRUE(track->controlPointForTime(1.0f) && track->controlPointForTime(2.0f));
  EXPECT_FLOAT_EQ(track->totalLengthInSeconds(), 4.0f);
  EXPECT_EQ(timeline().inPoint(), 1.0f);

  controller.cut();
  EXPECT_FLOAT_EQ(track->totalLengthInSeconds(), 3.0f);
  EXPECT_FLOAT_EQ(other->totalLengthInSeconds(), 4.0f) << "not selected for editing";
  EXPECT_EQ(timeline().inPoint(), -1.0f);
  EXPECT_EQ(timeline().outPoint(), -1.0f);
  controller.lift();
  EXPECT_EQ(ui->beeps, 2);

  timeline().setOutPoint(2.5f);
  controller.goToOut();
  EXPECT_EQ(controller.cursor(), 2.5f);
  controller.clearOut();
  controller.goToOut();
  EXPECT_EQ(controller.cursor(), -1.0f) << "an unset mark is -1";
}

TEST_F(TimelineWindowControllerTest, ClicksSelectTheClipSnapAndPrepareDrags) {
  const Rect2D bounds{0, 0, 800, 100};
  const double trackRow = 30;  // below the 16-pixel ruler and its gap
  controller.setCursor(3.0f);
  controller.playForwards();

  EXPECT_FALSE(controller.mouseDown({150, trackRow}, bounds, 100, {}));
  EXPECT_FALSE(controller.isAnimating());
  EXPECT_EQ(controller.selectedClip(), track->sequencedClips()[1]);
  EXPECT_EQ(controller.cursor(), 1.5f);

  // Option snaps to a control point within 2 s; Command on a control point
  // drags the point, with a copy of it as it was.
  const auto drag = controller.mouseDown({0, trackRow}, bounds, 100, {.command = true});
  ASSERT_TRUE(drag);
  EXPECT_EQ(drag->element, track->sequencedClips()[0]);
  EXPECT_EQ(drag->track, track);
  EXPECT_NE(drag->original, drag->element);
  EXPECT_EQ(drag->original->begin(), 0.0f);
  controller.mouseDown({250, trackRow}, bounds, 100, {.option = true});
  EXPECT_EQ(controller.cursor(), 4.0f);

  EXPECT_FALSE(controller.mouseDown({250, 90}, bounds, 100, {.command = true}));
  EXPECT_EQ(controller.selectedClip(), nullptr) << "no track there";
  controller.mouseDown({100, trackRow}, bounds, 0, {});
  EXPECT_EQ(controller.cursor(), 2.5f) << "a view without a time scale ignores the click";
}

TEST_F(TimelineWindowControllerTest, MovingTheCursorCommitsAControlPointEdit) {
  controller.setCursor(4.0f);
  ASSERT_EQ(controller.beginEditingAtCursor(), 1u);
  sphere->setSize(6.0f);
  controller.moveCursorToEdit(*track->sequencedClips()[0]);
  EXPECT_EQ(controller.cursor(), 0.0f);
  EXPECT_EQ(view.placedAt.back(), 0.0f);
  EXPECT_EQ(controller.editingClips().size(), 1u) << "jumping to an edit keeps it";
  EXPECT_EQ(sphere->size(), 6.0f) << "and keeps the value being edited";
  EXPECT_EQ(view.label, "4.00 sec 100 fr");

  controller.moveCursor(2.0f);
  EXPECT_TRUE(controller.editingClips().empty());
  EXPECT_FLOAT_EQ(sphere->size(), 3.0f) << "the ramp now ends at the edited value";

  // A new timeline in the document ends playback and selection.
  controller.playForwards();
  document.setTimeline(std::make_shared<Timeline>());
  EXPECT_FALSE(controller.isAnimating());
  EXPECT_EQ(controller.timeline(), document.timeline());
}

}  // namespace
}  // namespace cloudreel
