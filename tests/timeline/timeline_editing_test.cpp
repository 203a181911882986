// The timeline window's own edits on a real document: control points that
// roll and spans that slide between their neighbours on the frame grid,
// each drag one undo step; the context menus and the commands they carry;
// and adding a track for a property of the selected layer.
#include "timeline/timeline_editing.h"

#include <gtest/gtest.h>

#include "scene/my_document.h"
#include "scene/sphere.h"
#include "support/memory_defaults.h"
#include "timeline/float_clips.h"
#include "timeline/float_value_track.h"
#include "timeline/timeline.h"
#include "timeline/timeline_clip.h"

namespace cloudreel {
namespace {

// A sphere's size ramped 0 → 10 over 0..2 s and 10 → 4 over 2..4 s.
class TimelineEditingTest : public ::testing::Test {
 protected:
  TimelineEditingTest() {
    track->justAddClip(SingleValueClip::controlPointWithTime(0.0f, 0.0f));
    track->justAddClip(std::make_shared<AnimatedValueClip>(0.0f, 2.0f, 0.0f, 10.0f));
    track->justAddClip(SingleValueClip::controlPointWithTime(2.0f, 10.0f));
    track->justAddClip(std::make_shared<AnimatedValueClip>(2.0f, 2.0f, 10.0f, 4.0f));
    track->justAddClip(SingleValueClip::controlPointWithTime(4.0f, 4.0f));
    document->timeline()->addTrack(track);
    document->undoManager().closeEventGroup();
  }
  const std::shared_ptr<TimelineClip>& at(std::size_t i) { return track->sequencedClips().at(i); }
  // Begin and duration of every element.
  std::vector<std::pair<float, float>> times() {
    std::vector<std::pair<float, float>> result;
    for (const auto& clip : track->sequencedClips()) {
      result.emplace_back(clip->begin(), clip->duration());
    }
    return result;
  }
  using Times = std::vector<std::pair<float, float>>;

  testing::MemoryDefaults defaults;
  std::shared_ptr<MyDocument> document = std::make_shared<MyDocument>();
  std::shared_ptr<Sphere> sphere = std::make_shared<Sphere>();
  std::shared_ptr<FloatValueTrack> track =
      std::make_shared<FloatValueTrack>(sphere, "size", "Size");
  UndoManager& undo = document->undoManager();
};

TEST_F(TimelineEditingTest, AControlPointRollsBetweenItsSpansOnWholeFrames) {
  const Times original = times();
  TimelineDragEdit drag(track, at(2), 25);
  EXPECT_TRUE(drag.isControlPoint());
  drag.moveTo(0.51f);  // snaps to 2.52 s, frame 63
  EXPECT_FLOAT_EQ(drag.movedBy(), 0.52f);
  EXPECT_EQ(times(), (Times{{0, 0}, {0, 2.52f}, {2.52f, 0}, {2.52f, 1.48f}, {4, 0}}));
  EXPECT_FLOAT_EQ(track->clipForTime(2.51f)->floatValueForSequenceTime(2.52f), 10.0f);

  // Neither span can be made shorter than nothing.
  drag.moveTo(5.0f);
  EXPECT_EQ(times(), (Times{{0, 0}, {0, 4}, {4, 0}, {4, 0}, {4, 0}}));
  drag.moveTo(-9.0f);
  EXPECT_EQ(times(), (Times{{0, 0}, {0, 0}, {0, 0}, {0, 4}, {4, 0}}));

  drag.moveTo(-0.5f);
  ASSERT_TRUE(drag.commit(&undo));
  document->undoManager().closeEventGroup();
  const Times moved = times();
  EXPECT_EQ(undo.undoActionName(), "Move Control Point");
  undo.undo();
  EXPECT_EQ(times(), original);
  undo.redo();
  EXPECT_EQ(times(), moved);

  // A drag that comes back to where it began is no step at all.
  TimelineDragEdit still(track, at(2), 25);
  still.moveTo(0.3f);
  still.moveTo(0.001f);
  EXPECT_FALSE(still.commit(&undo));
  EXPECT_EQ(times(), moved);
}

TEST_F(TimelineEditingTest, ASpanSlidesWithItsControlPointsAndTheNeighboursGiveWay) {
  // The first span can slide later, the next one giving up its start...
  TimelineDragEdit first(track, at(1), 25);
  EXPECT_FALSE(first.isControlPoint());
  first.moveTo(1.0f);
  EXPECT_EQ(times(), (Times{{1, 0}, {1, 2}, {3, 0}, {3, 1}, {4, 0}}));
  // ...but not before 0 nor past the end of the next span.
  first.moveTo(-1.0f);
  EXPECT_EQ(times()[0], (std::pair<float, float>{0, 0}));
  first.moveTo(3.0f);
  EXPECT_EQ(times(), (Times{{2, 0}, {2, 2}, {4, 0}, {4, 0}, {4, 0}}));
  first.cancel();
  EXPECT_EQ(times(), (Times{{0, 0}, {0, 2}, {2, 0}, {2, 2}, {4, 0}}));

  // The last span slides as far as the user likes: the track grows.
  TimelineDragEdit last(track, at(3), 25);
  last.moveTo(10.0f);
  EXPECT_EQ(times(), (Times{{0, 0}, {0, 12}, {12, 0}, {12, 2}, {14, 0}}));
  ASSERT_TRUE(last.commit(&undo));
  EXPECT_EQ(undo.undoActionName(), "Slide Clip");
  EXPECT_FLOAT_EQ(document->timeline()->totalLengthInSeconds(), 14.0f);

  // Something not in the track moves nothing.
  TimelineDragEdit stranger(track, std::make_shared<TimelineClip>(0.0f, 1.0f), 25);
  stranger.moveTo(1.0f);
  EXPECT_FALSE(stranger.commit(&undo));
}

TEST_F(TimelineEditingTest, TheMenusOfATrackAndASpanCarryTheirCommands) {
  Timeline& timeline = *document->timeline();
  const Menu menu = timelineContextMenu(timeline, *track, at(1).get(), document.get());
  ASSERT_NE(menu.itemWithTitle("Remove"), nullptr);
  ASSERT_NE(menu.itemWithTitle("Insert Filler"), nullptr);
  ASSERT_NE(menu.itemWithTitle("Edit Spline"), nullptr);
  const MenuItem* ramps = menu.itemWithTitle("Time ramp");
  ASSERT_TRUE(ramps != nullptr && ramps->submenu);
  // A control point is no span: only the track's items.
  EXPECT_EQ(timelineContextMenu(timeline, *track, at(2).get(), document.get())
                .itemWithTitle("Edit Spline"),
            nullptr);

  int changes = 0;
  std::shared_ptr<Spline> edited;
  TimelineMenuHandlers handlers{[&](const std::shared_ptr<Spline>& s) { edited = s; }, &undo,
                                [&] { ++changes; }};
  EXPECT_TRUE(performTimelineMenuItem(ramps->submenu->items.at(2), timeline, handlers));
  EXPECT_EQ(at(1)->rampType(), 2);
  EXPECT_FALSE(performTimelineMenuItem(*menu.itemWithTitle("Edit Spline"), timeline, handlers));
  EXPECT_EQ(edited, at(1)->spline());

  // Removing is undone into the same place.
  timeline.addTrack(std::make_shared<FloatValueTrack>(sphere, "opacity", "Opacity"));
  undo.closeEventGroup();
  ASSERT_TRUE(performTimelineMenuItem(*menu.itemWithTitle("Remove"), timeline, handlers));
  EXPECT_EQ(timeline.indexOfTrack(*track), -1);
  EXPECT_EQ(undo.undoActionName(), "Remove Track");
  undo.closeEventGroup();
  undo.undo();
  EXPECT_EQ(timeline.indexOfTrack(*track), 1);
  EXPECT_EQ(changes, 2);
  undo.redo();
  EXPECT_EQ(timeline.tracks().size(), 2u);
}

TEST_F(TimelineEditingTest, TheSelectedLayersPropertiesBecomeTracksOneUndoStepEach) {
  document->addLayer(sphere);
  undo.closeEventGroup();
  const auto offered = addableTracks(*document);
  // The size track is there already; the transform and the camera's are not.
  std::vector<std::string> names;
  for (const AddableTrack& a : offered) {
    EXPECT_FALSE(a.track->managedKey() == "size" && a.track->theObject() == sphere);
    names.push_back(a.objectName + " / " + a.track->title());
  }
  ASSERT_FALSE(offered.empty());
  EXPECT_NE(std::find(names.begin(), names.end(), "Scene Camera / Field Of View"), names.end());

  const std::size_t before = document->timeline()->tracks().size();
  addTrackToDocument(*document, offered.front().track);
  ASSERT_EQ(document->timeline()->tracks().size(), before + 1);
  EXPECT_FALSE(offered.front().track->sequencedClips().empty());  // default content
  EXPECT_EQ(undo.undoActionName(), "Add Track");
  EXPECT_EQ(addableTracks(*document).size(), offered.size() - 1);
  undo.closeEventGroup();
  undo.undo();
  EXPECT_EQ(document->timeline()->tracks().size(), before);

  // A document read without a timeline gets one.
  document->setTimeline(nullptr);
  addTrackToDocument(*document, offered.back().track);
  ASSERT_TRUE(document->timeline());
  EXPECT_EQ(document->timeline()->tracks().size(), 2u);  // the ruler and the new one
}

}  // namespace
}  // namespace cloudreel
