// Clips: the ramps, the kinds' values, copying, splitting inside a track,
// the context menu and the archive.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>

#include "camera/camera.h"
#include "camera/slerp_camera_path.h"
#include "geometry/affine_transform.h"
#include "geometry/vector3.h"
#include "platform/log.h"
#include "scene/archive_helpers.h"
#include "timeline/affine_clip.h"
#include "timeline/float_clips.h"
#include "timeline/spline.h"
#include "timeline/timeline_track.h"
#include "timeline/vector_clips.h"

namespace cloudreel {
namespace {

// The elements of a track as (begin, duration, control point) triples.
struct Element {
  float begin;
  float duration;
  bool isControlPoint;
  friend bool operator==(const Element&, const Element&) = default;
};
std::vector<Element> elements(const TimelineTrack& track) {
  std::vector<Element> out;
  for (const auto& clip : track.sequencedClips()) {
    out.push_back({clip->begin(), clip->duration(), clip->isControlPoint()});
  }
  return out;
}

TEST(TimelineClip, RampsFollowTheirFormulasAndRefuseUnknownTypes) {
  struct Case {
    RampType type;
    float u;
    float expected;
  };
  const Case cases[] = {
      {RampType::Linear, 0.3f, 0.3f},        {RampType::EaseIn, 0.5f, 0.25f},
      {RampType::EaseOut, 0.5f, 0.75f},      {RampType::EaseInOut, 0.0f, 0.0f},
      {RampType::EaseInOut, 0.25f, 0.125f},  {RampType::EaseInOut, 0.5f, 0.5f},
      {RampType::EaseInOut, 1.0f, 1.0f},     {RampType::CustomSpline, 0.5f, 0.5f},
      {RampType::CustomSpline, 1.25f, 0.0f},  // the spline is 0 outside 0..1
  };
  TimelineClip clip(0.0f, 1.0f);
  for (const Case& c : cases) {
    clip.setRampType(static_cast<std::int32_t>(c.type));
    EXPECT_FLOAT_EQ(clip.rampValueForClipTime(c.u, 1.0f), c.expected)
        << "ramp " << static_cast<int>(c.type) << " at " << c.u;
  }
  clip.setRampType(2);
  clip.setRampType(5);
  clip.setRampType(-1);
  EXPECT_EQ(clip.rampType(), 2);

  // tEnd scales and tBegin offsets the normalised time.
  TimelineClip scaled(3.0f, 2.0f);
  scaled.setTBegin(0.25f);
  scaled.setTEnd(0.5f);
  EXPECT_FLOAT_EQ(scaled.tValueForClipTime(2.0f), 0.75f);
  EXPECT_FLOAT_EQ(scaled.clipTimeForSequenceTime(4.0f), 1.0f);
  EXPECT_FALSE(scaled.intersectsWithTime(5.0f));  // the end is exclusive
  EXPECT_TRUE(scaled.intersectsWithTime(3.0f));
}

TEST(TimelineClip, KindsAnswerTheirValues) {
  AnimatedValueClip ramp(2.0f, 4.0f, 10.0f, 20.0f);
  EXPECT_FLOAT_EQ(ramp.floatValueForSequenceTime(3.0f), 12.5f);
  ramp.setRampType(1);
  EXPECT_FLOAT_EQ(ramp.floatValueForSequenceTime(4.0f), 12.5f);

  TweenClip tween(0.0f, 2.0f, Vector3(0, 10, -4), Vector3(2, 20, 4));
  const auto mid = objectAs<Vector3>(tween.objectValueForSequenceTime(1.0f));
  ASSERT_TRUE(mid);
  EXPECT_TRUE(mid->isEqual(Vector3(1, 15, 0)));
  EXPECT_FALSE(TweenClip().objectValueForSequenceTime(0.5f)) << "a blank tween has no value";

  SlerpClip turn(0.0f, 1.0f, Vector3(0, 0, 0), Vector3(0, 0, 90));
  const auto half = objectAs<Vector3>(turn.objectValueForSequenceTime(0.5f));
  ASSERT_TRUE(half);
  // Halfway through a turn about one axis is half the turn about that axis
  // (whichever slot the angle conversion puts it in).
  std::array<double, 3> magnitudes = {std::fabs(half->x()), std::fabs(half->y()),
                                      std::fabs(half->z())};
  std::sort(magnitudes.begin(), magnitudes.end());
  EXPECT_NEAR(magnitudes[0] + magnitudes[1], 0.0, 1e-9);
  EXPECT_NEAR(magnitudes[2], 45.0, 1e-9);

  // A path clip runs the path's own time from 0 to 1 over the clip.
  auto path = std::make_shared<SLERPCameraPath>();
  path->setToTranslate(Vector3::vectorWithXYZ(10, 0, 0));
  AffineClip follow(path, 1.0f, 2.0f);
  const auto transform = objectAs<AffineTransform>(follow.objectValueForSequenceTime(2.0f));
  ASSERT_TRUE(transform);
  EXPECT_EQ(transform->mx(), path->cameraInWorldSpaceForTime(0.5f)->transformation()->mx());
  follow.highlightFrameForTime(2.0f);
  EXPECT_EQ(path->currentFrame(), 100);
  EXPECT_FALSE(AffineClip(nullptr, 0, 1).objectValueForSequenceTime(0.5f));
}

TEST(TimelineClip, CopiesDropTheControlPointFlagAndMostValues) {
  const auto point = SingleValueClip::controlPointWithTime(2.0f, 7.0f);
  point->setTBegin(0.5f);
  const auto pointCopy = std::dynamic_pointer_cast<SingleValueClip>(point->copy());
  ASSERT_TRUE(pointCopy);
  EXPECT_FALSE(pointCopy->isControlPoint());
  EXPECT_EQ(pointCopy->value(), 0.0f);
  EXPECT_EQ(pointCopy->begin(), 2.0f);
  EXPECT_EQ(pointCopy->tBegin(), 0.5f);
  EXPECT_NE(pointCopy->spline(), point->spline());
  EXPECT_EQ(pointCopy->spline()->points(), point->spline()->points()) << "points are shared";

  const auto vector = Vector3Clip::controlPointWithTime(1.0f, Vector3(1, 2, 3));
  const auto vectorCopy = std::dynamic_pointer_cast<Vector3Clip>(vector->copy());
  EXPECT_NE(vectorCopy->value(), vector->value());
  EXPECT_TRUE(vectorCopy->value()->isEqual(*vector->value()));

  auto path = std::make_shared<SLERPCameraPath>();
  const auto affineCopy =
      std::dynamic_pointer_cast<AffineClip>(std::make_shared<AffineClip>(path, 0, 1)->copy());
  EXPECT_EQ(affineCopy->path(), path);
}

TEST(TimelineClip, SplittingKeepsTheValueContinuousAndResetsTheNewRamp) {
  TimelineTrack track;
  auto ramp = std::make_shared<AnimatedValueClip>(0.0f, 4.0f, 0.0f, 10.0f);
  track.justAddClip(SingleValueClip::controlPointWithTime(0.0f, 0.0f));
  track.justAddClip(ramp);
  track.justAddClip(SingleValueClip::controlPointWithTime(4.0f, 10.0f));
  const auto point =
      std::dynamic_pointer_cast<SingleValueClip>(ramp->splitClipInSequence(track, 1.0f));
  ASSERT_TRUE(point);
  EXPECT_FLOAT_EQ(point->value(), 2.5f);
  EXPECT_EQ(elements(track),
            (std::vector<Element>{
                {0, 0, true}, {0, 1, false}, {1, 0, true}, {1, 3, false}, {4, 0, true}}));
  const auto& second = dynamic_cast<const AnimatedValueClip&>(*track.sequencedClips()[3]);
  EXPECT_FLOAT_EQ(ramp->valueEnd(), 2.5f);
  EXPECT_FLOAT_EQ(second.valueBegin(), 2.5f);
  EXPECT_FLOAT_EQ(second.valueEnd(), 10.0f);

  // The new half of an eased clip starts linear.
  TimelineTrack eased;
  auto ease = std::make_shared<AnimatedValueClip>(0.0f, 2.0f, 0.0f, 1.0f);
  ease->setRampType(3);
  eased.justAddClip(ease);
  ease->splitClipInSequence(eased, 1.0f);
  EXPECT_EQ(ease->rampType(), 3);
  EXPECT_EQ(eased.sequencedClips()[2]->rampType(), 0);

  // Tweens log their split; a path clip's second half has no path.
  TimelineTrack vectors;
  auto tween = std::make_shared<TweenClip>(0.0f, 2.0f, Vector3(0, 0, 0), Vector3(4, 0, 0));
  vectors.justAddClip(tween);
  CapturedLog log;
  const auto vectorPoint =
      std::dynamic_pointer_cast<Vector3Clip>(tween->splitClipInSequence(vectors, 0.5f));
  ASSERT_TRUE(vectorPoint);
  EXPECT_TRUE(vectorPoint->isControlPoint());
  EXPECT_TRUE(vectorPoint->value()->isEqual(Vector3(1, 0, 0)));
  EXPECT_EQ(log.count("split tween in seq"), 1);

  TimelineTrack paths;
  auto follow = std::make_shared<AffineClip>(std::make_shared<SLERPCameraPath>(), 0.0f, 2.0f);
  paths.justAddClip(follow);
  ASSERT_TRUE(follow->splitClipInSequence(paths, 1.0f));
  EXPECT_FALSE(dynamic_cast<AffineClip&>(*paths.sequencedClips()[2]).path());

  // Kinds that cannot split, and a clip outside the track, change nothing.
  EXPECT_FALSE(point->splitClipInSequence(track, 0.5f));
  AnimatedValueClip stranger(0.0f, 4.0f, 0.0f, 1.0f);
  EXPECT_FALSE(stranger.splitClipInSequence(track, 1.0f));
  EXPECT_EQ(track.sequencedClips().size(), 5u);
}

TEST(TimelineClip, MenuOffersTheEditCommandsAndTheRamps) {
  auto clip = std::make_shared<SlerpClip>(0.0f, 1.0f, Vector3(), Vector3());
  clip->setRampType(3);
  Menu menu;
  clip->addItemsToMenu(menu, nullptr, nullptr, nullptr);
  std::vector<std::string> titles;
  for (const MenuItem& item : menu.items) {
    titles.push_back(item.isSeparator ? "-" : item.title);
  }
  EXPECT_EQ(titles, (std::vector<std::string>{"Slerp", "-", "Edit In Point", "Edit Out Point",
                                              "Add cut here", "Edit Spline", "Time ramp"}));
  EXPECT_EQ(menu.itemWithTitle("Edit Spline")->action, "editSpline:");
  EXPECT_EQ(menu.itemWithTitle("Edit Spline")->representedObject, clip);
  const Menu& ramps = *menu.itemWithTitle("Time ramp")->submenu;
  EXPECT_EQ(ramps.title, "Ramps");
  ASSERT_EQ(ramps.items.size(), 5u);
  EXPECT_EQ(ramps.items[3].title, "Ease-in&out Quadratic");
  EXPECT_TRUE(ramps.items[3].isChecked);
  EXPECT_FALSE(ramps.items[0].isChecked);
  ramps.items[4].perform(ramps.items[4]);
  EXPECT_EQ(clip->rampType(), 4);
}

TEST(TimelineClip, EveryKindSurvivesTheArchive) {
  auto path = std::make_shared<SLERPCameraPath>();
  auto spline = std::make_shared<Spline>();
  spline->insertPoint({0.5, 0.8});
  auto ramp = std::make_shared<AnimatedValueClip>(1.5f, 2.0f, 3.0f, 4.0f);
  ramp->setRampType(4);
  ramp->setSpline(spline);
  ramp->setTBegin(0.125f);
  const std::vector<std::shared_ptr<TimelineClip>> clips = {
      SingleValueClip::controlPointWithTime(2.0f, 6.5f), ramp,
      std::make_shared<SlerpClip>(0.0f, 1.0f, Vector3(1, 2, 3), Vector3(4, 5, 6)),
      Vector3Clip::controlPointWithTime(1.0f, Vector3(7, 8, 9)),
      std::make_shared<AffineClip>(path, 0.5f, 3.0f)};
  for (const auto& clip : clips) {
    const auto back = testing::roundTrip(clip);
    ASSERT_TRUE(back) << clip->className();
    EXPECT_EQ(back->className(), clip->className());
    EXPECT_EQ(back->description(), clip->description()) << clip->className();
    EXPECT_EQ(back->isControlPoint(), clip->isControlPoint());
    EXPECT_EQ(back->begin(), clip->begin());
    EXPECT_EQ(back->duration(), clip->duration());
    EXPECT_EQ(back->rampType(), clip->rampType());
    EXPECT_EQ(back->tBegin(), clip->tBegin());
    for (float t : {0.25f, 0.5f, 2.5f}) {
      EXPECT_EQ(back->floatValueForSequenceTime(t), clip->floatValueForSequenceTime(t));
    }
  }
  // An older clip without a spline gets the default one.
  const auto old = testing::decodeFrom<TimelineClip>(
      "TimelineClip", [](KeyedArchiver& coder) { coder.encodeFloat(2.0f, "duration"); });
  ASSERT_TRUE(old && old->spline());
  EXPECT_EQ(old->spline()->points().size(), 2u);
}

}  // namespace
}  // namespace cloudreel
