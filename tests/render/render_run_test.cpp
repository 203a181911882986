// Render runs: which frames a range covers, the timeline applied on the
// main thread before each frame is drawn in the background, cancel taking
// effect between frames, and the document's view updates off for the run
// and on again at its end.
#include "timeline/render_run.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <set>

#include "camera/camera.h"
#include "render/gl/image_file.h"
#include "render/offline_gl_renderer.h"
#include "render/render_properties_controller.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"
#include "support/memory_defaults.h"
#include "support/pixel_harness.h"
#include "support/temp_dir.h"
#include "timeline/float_clips.h"
#include "timeline/float_value_track.h"
#include "timeline/timeline.h"
#include "timeline/timeline_window_controller.h"

namespace cloudreel {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;

TEST(RenderRange, FramesAndTimesKeepTheirOffByOneRules) {
  Timeline timeline;
  timeline.setFps(10);
  const RenderFrameRange whole = wholeTimelineRange(timeline);
  EXPECT_EQ(whole.firstFrame(), 0);
  EXPECT_EQ(whole.last, 10);
  EXPECT_EQ(whole.frameCount(), 11);

  timeline.setFps(25);
  timeline.setInPoint(0.0f);
  timeline.setOutPoint(0.5f);
  EXPECT_EQ(markedRange(timeline).firstFrame(), 0);
  EXPECT_EQ(markedRange(timeline).last, 12);
  // 25 × 0.02 - 1 = -0.5 truncates to 0: the first frame is 1.
  timeline.setInPoint(0.02f);
  EXPECT_EQ(markedRange(timeline).firstFrame(), 1);

  EXPECT_FLOAT_EQ(timeForRenderFrame(timeline, 5), 0.2f);
  timeline.setFps(0);
  EXPECT_EQ(timeForRenderFrame(timeline, 5), 0.0f);
  EXPECT_EQ((RenderFrameRange{4, 2}).frameCount(), 0);
}

TEST(RenderRange, TheMarkedRangeIsRefusedUntilBothMarksAreSetInOrder) {
  Timeline timeline;
  timeline.setFps(10);
  // The whole timeline needs no marks.
  ASSERT_TRUE(renderRangeForSelection(timeline, 1));
  EXPECT_EQ(renderRangeForSelection(timeline, 1)->last, 10);
  struct Case {
    float in, out;
    bool accepted;
    const char* says;
  };
  for (const Case& c : {Case{-1.0f, -1.0f, false, "set both"}, Case{0.2f, -1.0f, false, "set both"},
                        Case{-1.0f, 0.5f, false, "set both"}, Case{0.5f, 0.2f, false, "before"},
                        Case{0.2f, 0.5f, true, ""}, Case{0.3f, 0.3f, true, ""}}) {
    timeline.setInPoint(c.in);
    timeline.setOutPoint(c.out);
    Error error;
    const auto range = renderRangeForSelection(timeline, 2, &error);
    EXPECT_EQ(range.has_value(), c.accepted) << c.in << " " << c.out;
    if (range) {
      EXPECT_EQ(range->firstFrame(), markedRange(timeline).firstFrame());
      EXPECT_EQ(range->last, markedRange(timeline).last);
    } else {
      EXPECT_NE(error.message.find(c.says), std::string::npos) << error.message;
    }
  }
}

TEST(RenderRun, WithoutARendererTheRunStillWalksItsRangeAndRestoresViewUpdates) {
  const testing::MemoryDefaults defaults;
  MyDocument document;
  RunLoop loop;
  std::vector<int> prepared;
  std::vector<int> unwritten;
  bool viewsOffDuringRun = true;
  std::optional<bool> cancelled;
  RenderRun::Hooks hooks;
  hooks.prepareFrame = [&](int frame) {
    prepared.push_back(frame);
    viewsOffDuringRun = viewsOffDuringRun && !document.enableViewUpdates();
    return std::shared_ptr<Camera>();
  };
  hooks.frameFinished = [&](int frame, bool written, const Error&) {
    if (!written) {
      unwritten.push_back(frame);
    }
  };
  hooks.finished = [&](bool c) { cancelled = c; };
  auto run = RenderRun::create(document, nullptr, {2, 5}, hooks, loop);
  run->start();
  ASSERT_TRUE(loop.runUntil([&] { return cancelled.has_value(); }, 10s));
  EXPECT_EQ(prepared, (std::vector{3, 4, 5}));
  EXPECT_EQ(unwritten, (std::vector{3, 4, 5}));
  EXPECT_TRUE(viewsOffDuringRun);
  EXPECT_TRUE(document.enableViewUpdates());
  EXPECT_FALSE(*cancelled);
  EXPECT_FALSE(run->isRunning());
}

class RenderRunTest : public testing::PixelTest {
 protected:
  void SetUp() override {
    PixelTest::SetUp();
    if (IsSkipped() || HasFatalFailure()) {
      return;
    }
    // One point at the centre, its size ramped from 1 to 11 over the
    // timeline's one second at 10 frames a second.
    layer = std::make_shared<PointLayer>();
    layer->allocatePointArrayWithSize(1);
    layer->setNPoints(1);
    layer->colorPoints()[0] = {0.0f, 0.0f, -5.0f, 255, 255, 255, 0};
    document.addLayer(layer);
    auto track = std::make_shared<FloatValueTrack>(layer, "pointSize", "Point Size");
    track->justAddClip(std::make_shared<AnimatedValueClip>(0.0f, 1.0f, 1.0f, 11.0f));
    document.timeline()->addTrack(track);
    document.timeline()->setFps(10);
    camera->setZNear(1.0f);
    camera->setZFar(10.0f);
  }

  std::shared_ptr<RenderRun> timelineRun(RenderFrameRange range, RenderRun::Hooks hooks) {
    auto renderer = OfflineGLRenderer::initWithSceneContextExportDepth(
        OpenGLScene::initWithWidthHeightFieldOfView(32, 32, 30.0), *document.sharedGLContext(),
        false);
    EXPECT_TRUE(renderer);
    renderer->setOutputPath(dir.path());
    hooks.prepareFrame = [this](int frame) {
      const auto t = timeForRenderFrame(*document.timeline(), frame);
      times.push_back(t);
      document.timeline()->applyForTime(t);
      return std::static_pointer_cast<Camera>(camera);
    };
    hooks.finished = [this](bool c) { cancelled = c; };
    return RenderRun::create(document, std::move(renderer), range, std::move(hooks), loop);
  }
  // White pixels of a written frame.
  int drawnIn(const std::string& name) {
    const auto image = gl::readTiff(dir / name);
    if (!image) {
      return -1;
    }
    int drawn = 0;
    for (int y = 0; y < image->height; ++y) {
      for (int x = 0; x < image->width; ++x) {
        drawn += image->sample(x, y, 0) == 255 ? 1 : 0;
      }
    }
    return drawn;
  }
  std::set<std::string> filesWritten() const { return testing::fileNamesIn(dir.path()); }

  testing::MemoryDefaults defaults;
  testing::TempDir dir;
  MyDocument document;
  std::shared_ptr<PointLayer> layer;
  std::shared_ptr<Camera> camera = std::make_shared<Camera>();
  RunLoop loop;
  std::vector<float> times;
  std::optional<bool> cancelled;
};

TEST_F(RenderRunTest, TheWholeTimelineIsDrawnFrameByFrameAsAnimatedAtEachTime) {
  std::vector<std::pair<int, int>> progress;
  RenderRun::Hooks hooks;
  hooks.progress = [&](int frame, int last) { progress.emplace_back(frame, last); };
  hooks.frameFinished = [&](int, bool written, const Error& error) {
    EXPECT_TRUE(written) << error.message;
  };
  auto run = timelineRun(wholeTimelineRange(*document.timeline()), hooks);
  run->start();
  EXPECT_FALSE(document.enableViewUpdates());
  ASSERT_TRUE(loop.runUntil([&] { return cancelled.has_value(); }, 60s));
  EXPECT_FALSE(*cancelled);
  EXPECT_TRUE(document.enableViewUpdates());

  // Frames 0 to 10: one more than the timeline's ten.
  ASSERT_EQ(filesWritten().size(), 11U);
  ASSERT_EQ(times.size(), 11U);
  EXPECT_FLOAT_EQ(times[4], 0.4f);
  EXPECT_EQ(progress.front(), std::pair(0, 10));
  EXPECT_EQ(progress.back(), std::pair(10, 10));
  // The point grows with the ramp: each frame shows the size at its time.
  EXPECT_EQ(drawnIn("out_0000.tiff"), 1);
  int previous = 0;
  for (int frame = 0; frame < 10; ++frame) {
    const int drawn = drawnIn(FramePattern().format(frame));
    EXPECT_GT(drawn, previous) << "frame " << frame;
    previous = drawn;
  }
  EXPECT_EQ(previous, 100);
  // The extra frame at the very end lies past the ramp, where the track
  // gives its default size.
  EXPECT_EQ(drawnIn("out_0010.tiff"), 1);
}

TEST_F(RenderRunTest, CancelStopsBeforeTheNextFrameAfterFinishingTheOneInFlight) {
  bool cancelPressed = false;
  RenderRun::Hooks hooks;
  // Pressed as the first frame starts: that frame is still drawn and
  // written, the next one never starts.
  hooks.progress = [&](int, int) { cancelPressed = true; };
  hooks.hasCancelled = [&] { return cancelPressed; };
  auto run = timelineRun({0, 10}, hooks);
  run->start();
  ASSERT_TRUE(loop.runUntil([&] { return cancelled.has_value(); }, 60s));
  EXPECT_TRUE(*cancelled);
  EXPECT_EQ(filesWritten(), (std::set<std::string>{"out_0001.tiff"}));
  EXPECT_TRUE(document.enableViewUpdates());
}

// The timeline window's render: the settings sheet's values, the marked
// range, the cursor following each frame, the progress sheet's label.
TEST_F(RenderRunTest, TheTimelineWindowRendersTheMarkedRangeWithTheSheetsSettings) {
  TimelineWindowController controller(loop);
  controller.setDocument(&document);
  RenderPropertiesController settings;
  settings.setWidth(24);
  settings.setHeight(16);
  settings.setRenderRangeSelected(static_cast<int>(RenderRange::Marks));
  settings.setOutputPath(dir.path().string());
  settings.setOutputPattern(*FramePattern::parse("f%d.tif"));
  settings.setShouldRenderDepth(true);
  const auto progress = std::make_shared<RenderProgressController>();
  // Without both marks the marked range is refused, with the reason.
  document.timeline()->setInPoint(0.2f);
  Error refused;
  EXPECT_FALSE(controller.renderTimeline(settings, progress, {}, &refused));
  EXPECT_NE(refused.message.find("set both the in and the out mark"), std::string::npos);
  EXPECT_TRUE(filesWritten().empty());
  document.timeline()->setOutPoint(0.5f);
  const auto run = controller.renderTimeline(settings, progress, [this](bool c) { cancelled = c; });
  ASSERT_TRUE(run);
  ASSERT_TRUE(loop.runUntil([&] { return cancelled.has_value(); }, 60s));
  // truncate(10 × 0.2 - 1) + 1 = 2 to truncate(10 × 0.5) = 5.
  EXPECT_EQ(filesWritten(),
            (std::set<std::string>{"f2.tif", "f3.tif", "f4.tif", "f5.tif", "depth_f2.tif",
                                   "depth_f3.tif", "depth_f4.tif", "depth_f5.tif"}));
  EXPECT_EQ(progress->label(), "frame 5 of 5");
  EXPECT_FLOAT_EQ(controller.cursor(), 0.5f);
  EXPECT_FLOAT_EQ(layer->pointSize(), 6.0f);
  const auto frame = gl::readTiff(dir / "f2.tif");
  ASSERT_TRUE(frame);
  EXPECT_EQ(frame->width, 24);
}

}  // namespace
}  // namespace cloudreel
