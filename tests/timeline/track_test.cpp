// Tracks: lookups and their tie-breaks, the ripple insert, lift and cut,
// applying values to objects, editing a control point's value, the menus
// and the archive.
#include <gtest/gtest.h>

#include "camera/slerp_camera_path.h"
#include "camera/transform_stack.h"
#include "geometry/affine_transform.h"
#include "platform/log.h"
#include "scene/archive_helpers.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"
#include "timeline/affine_clip.h"
#include "timeline/affine_track.h"
#include "timeline/edit_point.h"
#include "timeline/float_clips.h"
#include "timeline/float_value_track.h"
#include "timeline/menu_description.h"

namespace cloudreel {
namespace {

using Span = std::pair<float, float>;  // begin, duration; a control point has duration 0

// A float track over the given spans, with control points between them;
// spans end to end from 0, ramping from 0 up by 1 per second.
std::shared_ptr<FloatValueTrack> floatTrack(const ObjectPtr& object,
                                            const std::vector<float>& durations) {
  auto track = std::make_shared<FloatValueTrack>(object, "pointSize", "Point Size");
  float t = 0.0f;
  track->justAddClip(SingleValueClip::controlPointWithTime(t, t));
  for (float d : durations) {
    track->justAddClip(std::make_shared<AnimatedValueClip>(t, d, t, t + d));
    t += d;
    track->justAddClip(SingleValueClip::controlPointWithTime(t, t));
  }
  return track;
}

std::vector<Span> spans(const TimelineTrack& track) {
  std::vector<Span> out;
  for (const auto& clip : track.sequencedClips()) {
    out.emplace_back(clip->begin(), clip->duration());
  }
  return out;
}

TEST(TimelineTrack, LookupsKeepTheirToleranceAndTieBreaks) {
  const auto track = floatTrack(nullptr, {1.0f, 2.0f});
  const auto& clips = track->sequencedClips();
  EXPECT_EQ(track->clipForTime(1.0f), clips[3]) << "a boundary belongs to the clip beginning there";
  EXPECT_EQ(track->clipForTime(0.0f), clips[1]);
  EXPECT_FALSE(track->clipForTime(3.0f)) << "the end is exclusive";
  EXPECT_EQ(track->controlPointForTime(1.000009f), clips[2]);
  EXPECT_FALSE(track->controlPointForTime(1.00002f));
  EXPECT_EQ(track->controlPointWithin(0.6f, 0.5f), clips[0]) << "equally near: the earlier";
  EXPECT_EQ(track->controlPointWithin(0.6f, 0.55f), clips[2]);
  EXPECT_FALSE(track->controlPointWithin(0.4f, 0.5f));
  EXPECT_EQ(track->editToLeftOfTime(1.0f), clips[0]);
  EXPECT_EQ(track->editToLeftOfTime(2.0f), clips[2]);
  EXPECT_EQ(track->editToRightOfTime(1.0f), clips[4]);
  EXPECT_FALSE(track->editToRightOfTime(3.0f));
  EXPECT_EQ(track->controlPointToLeftOfClip(*clips[3]), clips[2]);
  EXPECT_EQ(track->controlPointToRightOfClip(*clips[3]), clips[4]);
  EXPECT_FALSE(track->controlPointToLeftOfClip(*clips[0]));
  EXPECT_FALSE(track->controlPointToRightOfClip(*clips[4]));
  EXPECT_FLOAT_EQ(track->totalLengthInSeconds(), 3.0f);
  EXPECT_EQ(FloatValueTrack().totalLengthInSeconds(), 0.0f);

  auto layer = std::make_shared<AnimatedLayer>();
  layer->setNFrames(50);
  EXPECT_FLOAT_EQ(TimelineTrack(layer, "frame", "Time").objectDurationInSeconds(), 2.0f);
  EXPECT_FLOAT_EQ(FloatValueTrack(std::make_shared<PointLayer>(), "pointSize", "Point Size")
                      .objectDurationInSeconds(),
                  20.0f);
}

TEST(TimelineTrack, RippleInsertSplitsShiftsAndRefusesTimesInNoClip) {
  auto track = floatTrack(nullptr, {2.0f, 2.0f});
  CapturedLog log;
  ASSERT_TRUE(track->insertClipInSequenceAt(std::make_shared<TimelineClip>(9.0f, 1.5f), 1.0f));
  EXPECT_EQ(spans(*track), (std::vector<Span>{{0, 0},
                                              {0, 1},
                                              {1, 0},
                                              {1, 1.5f},
                                              {2.5f, 0},
                                              {2.5f, 1},
                                              {3.5f, 0},
                                              {3.5f, 2},
                                              {5.5f, 0}}));
  const auto& clips = track->sequencedClips();
  EXPECT_TRUE(clips[2]->isControlPoint());
  EXPECT_FALSE(clips[4]->isControlPoint()) << "the shifted copy of the split point is ordinary";
  EXPECT_EQ(log.count("moving clip"), 4);
  EXPECT_EQ(log.count("done inserting"), 1);

  // Times in no clip, and clips that cannot split, leave the track as it was.
  const auto before = spans(*track);
  EXPECT_FALSE(track->insertClipInSequenceAt(std::make_shared<TimelineClip>(0, 1), 5.5f));
  EXPECT_FALSE(track->insertClipInSequenceAt(std::make_shared<TimelineClip>(0, 1), -1.0f));
  EXPECT_FALSE(track->insertClipInSequenceAt(std::make_shared<TimelineClip>(0, 1), 1.2f));
  EXPECT_EQ(spans(*track), before);

  // An empty track takes the clip as it is, between points at 0 and its length.
  TimelineTrack empty;
  ASSERT_TRUE(empty.insertClipInSequenceAt(std::make_shared<TimelineClip>(4.0f, 3.0f), 8.0f));
  EXPECT_EQ(spans(empty), (std::vector<Span>{{0, 0}, {4, 3}, {3, 0}}));
}

TEST(TimelineTrack, LiftAndCutKeepTheElementBeforeTheEndPoint) {
  // One clip between the two points: nothing goes.
  auto single = floatTrack(nullptr, {2.0f});
  single->liftFrom(0.0f, 2.0f);
  EXPECT_EQ(single->sequencedClips().size(), 3u);

  // clip, point, clip between them: the first two go.
  auto lifted = floatTrack(nullptr, {1.0f, 1.0f, 1.0f});
  const auto kept = lifted->sequencedClips()[5];
  lifted->liftFrom(1.0f, 3.0f);
  EXPECT_EQ(spans(*lifted), (std::vector<Span>{{0, 0}, {0, 1}, {1, 0}, {2, 1}, {3, 0}}));
  EXPECT_EQ(lifted->sequencedClips()[3], kept);

  // Cutting adds the missing edits and pulls the point at b and everything
  // after it in; the one clip between the points stays, with its old times.
  auto cut = floatTrack(nullptr, {4.0f, 2.0f});
  cut->cutFrom(1.0f, 3.0f);
  EXPECT_EQ(
      spans(*cut),
      (std::vector<Span>{{0, 0}, {0, 1}, {1, 0}, {1, 2}, {1, 0}, {1, 1}, {2, 0}, {2, 2}, {4, 0}}));

  // Bounds in no clip: nothing to lift.
  auto outside = floatTrack(nullptr, {1.0f});
  outside->liftFrom(5.0f, 6.0f);
  outside->cutFrom(-2.0f, 0.5f);
  EXPECT_EQ(spans(*outside),
            (std::vector<Span>{{0, 0}, {0, 0.5f}, {0.5f, 0}, {0.5f, 0.5f}, {1, 0}}));
}

TEST(FloatValueTrack, AppliesThroughKeyValueCodingWithTheDefaultOutsideClips) {
  auto layer = std::make_shared<PointLayer>();
  layer->setPointSize(3.0f);
  auto track = std::make_shared<FloatValueTrack>(layer, "pointSize", "Point Size");
  EXPECT_EQ(track->defaultValue(), 3.0f);
  track->justAddClip(SingleValueClip::controlPointWithTime(1.0f, 5.0f));
  track->justAddClip(std::make_shared<AnimatedValueClip>(1.0f, 2.0f, 5.0f, 9.0f));
  track->justAddClip(SingleValueClip::controlPointWithTime(3.0f, 9.0f));

  int changes = 0;
  CallbackObserver observer([&](auto, auto&, auto&, auto) { ++changes; });
  layer->addObserver(observer, "pointSize", ObservingOptions::New, "");
  const std::pair<float, float> expected[] = {
      {0.5f, 3.0f}, {2.0f, 7.0f}, {3.0f, 3.0f}, {9.0f, 3.0f}};
  for (const auto& [t, size] : expected) {
    track->applyEffectForTime(t);
    EXPECT_FLOAT_EQ(layer->pointSize(), size) << "at " << t;
  }
  EXPECT_EQ(changes, 4);
  layer->removeObserver(observer, "pointSize");

  // Default content: a flat ramp at the default value between two points.
  FloatValueTrack fresh(layer, "pointSize", "Point Size");
  fresh.addDefaultClipAtTime(1.0f, 4.0f);
  EXPECT_EQ(spans(fresh), (std::vector<Span>{{1, 0}, {1, 4}, {5, 0}}));
  EXPECT_FLOAT_EQ(fresh.sequencedClips()[1]->floatValueForSequenceTime(2.0f), 3.0f);
}

TEST(FloatValueTrack, EditingAControlPointReshapesTheClipsBesideIt) {
  auto layer = std::make_shared<PointLayer>();
  auto track = floatTrack(layer, {1.0f, 1.0f});
  const auto point = std::dynamic_pointer_cast<SingleValueClip>(track->sequencedClips()[2]);
  EditPoint edit(point, track);
  edit.beginEditingClip();
  EXPECT_TRUE(point->isEditing());
  layer->setPointSize(6.0f);
  EXPECT_EQ(point->value(), 6.0f);
  edit.endEditingClip();
  EXPECT_FALSE(point->isEditing());
  layer->setPointSize(8.0f);
  EXPECT_EQ(point->value(), 6.0f) << "no longer observing";
  const auto& clips = track->sequencedClips();
  EXPECT_EQ(dynamic_cast<AnimatedValueClip&>(*clips[1]).valueEnd(), 6.0f);
  EXPECT_EQ(dynamic_cast<AnimatedValueClip&>(*clips[3]).valueBegin(), 6.0f);
  EXPECT_EQ(dynamic_cast<AnimatedValueClip&>(*clips[3]).valueEnd(), 2.0f);
}

TEST(AffineTrack, FollowsItsPathAndResetsToIdentityOutsideClips) {
  auto layer = std::make_shared<PointLayer>();
  auto path = std::make_shared<SLERPCameraPath>();
  path->setToTranslate(Vector3::vectorWithXYZ(0, 8, 0));
  auto track = std::make_shared<AffineTrack>(layer, "Transform");
  track->addDefaultClipAtTime(0.0f, 2.0f);
  std::dynamic_pointer_cast<AffineClip>(track->sequencedClips()[1])->setPath(path);

  track->applyEffectForTime(1.0f);
  std::array<double, 3> t{};
  layer->animationTransform()->getTranslation(t);
  EXPECT_EQ(t, (std::array<double, 3>{0, 4, 0}));
  EXPECT_EQ(path->currentFrame(), 100);
  EXPECT_EQ(track->currentValueDescription(), Vector3(0, 4, 0).description());
  track->applyEffectForTime(2.0f);
  EXPECT_EQ(layer->animationTransform()->mx(), AffineTransform().mx());

  // The menu offers every camera path and every other transform stack.
  MyDocument document;
  auto named = std::make_shared<SLERPCameraPath>();
  named->setName("Fly-in");
  document.addLayer(named);
  auto stack = document.transformStacks().front();
  auto stackTrack = std::make_shared<AffineTrack>(stack, "Transform");
  Menu menu;
  track->addItemsToMenu(menu, nullptr, &document);
  Menu stackMenu;
  stackTrack->addItemsToMenu(stackMenu, nullptr, &document);
  std::vector<std::string> titles;
  for (const MenuItem& item : menu.items) {
    titles.push_back(item.isSeparator ? "-" : item.title + "/" + item.action);
  }
  EXPECT_EQ(titles,
            (std::vector<std::string>{
                "-", "Remove/menuRemoveTrack:", "Fly-in/menuAddDiscreteClip:",
                stack->name() + "/menuAddDiscreteClip:", "Insert Filler/menuInsertFiller:"}));
  EXPECT_EQ(stackMenu.items.size(), menu.items.size() - 1) << "a stack is not offered to itself";
  const auto insertion =
      std::dynamic_pointer_cast<ClipInsertion>(menu.itemWithTitle("Fly-in")->representedObject);
  ASSERT_TRUE(insertion);
  EXPECT_EQ(insertion->track(), track);
  EXPECT_EQ(std::dynamic_pointer_cast<AffineClip>(insertion->clip())->path(), named);
  EXPECT_FLOAT_EQ(insertion->clip()->duration(), named->durationInSeconds());
}

TEST(TimelineTrack, ArchiveKeepsClipsAndTheObjectReference) {
  auto layer = std::make_shared<PointLayer>();
  auto track = floatTrack(layer, {1.0f, 2.0f});
  track->setTimelineHeight(40.5);
  track->setDefaultValue(1.5f);

  testing::TopLevelArchive archive([&](KeyedArchiver& coder) {
    coder.encodeObject(layer, "layer");
    coder.encodeObject(track, "track");
  });
  ASSERT_TRUE(archive.coder);
  const auto layerBack = archive.coder->decodeObjectOfClassForKey<PointLayer>("layer");
  const auto back = archive.coder->decodeObjectOfClassForKey<FloatValueTrack>("track");
  ASSERT_TRUE(back && layerBack);
  EXPECT_EQ(back->theObject(), layerBack);
  EXPECT_EQ(back->managedKey(), "pointSize");
  EXPECT_EQ(back->timelineHeight(), 40.5);
  EXPECT_EQ(back->defaultValue(), 1.5f);
  EXPECT_TRUE(back->title().empty()) << "titles come from the object again";
  EXPECT_EQ(spans(*back), spans(*track));
}

}  // namespace
}  // namespace cloudreel
