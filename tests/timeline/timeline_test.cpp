// The timeline as a whole: length and frames, edits across tracks, the
// layouts, the tracks objects offer, and an animation of a real scene
// applied, undone and archived.
#include "timeline/timeline.h"

#include <gtest/gtest.h>

#include "camera/camera.h"
#include "camera/camera_field.h"
#include "camera/slerp_camera_path.h"
#include "geometry/affine_transform.h"
#include "scene/archive_helpers.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"
#include "scene/sphere.h"
#include "timeline/affine_clip.h"
#include "timeline/affine_track.h"
#include "timeline/edit_point.h"
#include "timeline/float_clips.h"
#include "timeline/float_value_track.h"
#include "timeline/timeline_clip.h"

namespace cloudreel {
namespace {

// A float track with control points at the given times and ramps between.
std::shared_ptr<FloatValueTrack> trackWithPoints(const ObjectPtr& object, const std::string& key,
                                                 const std::vector<float>& times,
                                                 const std::vector<float>& values) {
  auto track = std::make_shared<FloatValueTrack>(object, key, key);
  for (std::size_t i = 0; i < times.size(); ++i) {
    if (i > 0) {
      track->justAddClip(std::make_shared<AnimatedValueClip>(times[i - 1], times[i] - times[i - 1],
                                                             values[i - 1], values[i]));
    }
    track->justAddClip(SingleValueClip::controlPointWithTime(times[i], values[i]));
  }
  return track;
}

TEST(Timeline, LengthInSecondsAndFrames) {
  Timeline timeline;
  ASSERT_EQ(timeline.tracks().size(), 1u);
  EXPECT_EQ(timeline.tracks()[0]->className(), "TimecodeTrack");
  EXPECT_EQ(timeline.totalLengthInSeconds(), 1.0f);
  EXPECT_EQ(timeline.totalLengthInFrames(), 25);
  EXPECT_EQ(timeline.heightOfAllTracks(), 21.0);
  timeline.addTrack(trackWithPoints(nullptr, "a", {0.0f, 2.999f}, {0, 1}));
  EXPECT_EQ(timeline.totalLengthInFrames(), 74);
  timeline.setFps(0);
  EXPECT_EQ(timeline.totalLengthInFrames(), 0);
}

TEST(Timeline, EditsAcrossTracksKeepTheirTieBreaks) {
  Timeline timeline;
  auto first = trackWithPoints(nullptr, "a", {0.0f, 1.0f, 3.0f}, {0, 1, 2});
  auto second = trackWithPoints(nullptr, "b", {0.0f, 1.0f, 2.0f}, {0, 1, 2});
  timeline.addTrack(first);
  timeline.addTrack(second);

  EXPECT_FALSE(timeline.editToLeftOfTime(0.5f)) << "the point at 0 is never answered";
  const auto left = timeline.editToLeftOfTime(1.5f);
  ASSERT_TRUE(left);
  EXPECT_EQ(left->track(), first) << "equal times: the earlier track";
  EXPECT_EQ(timeline.editToRightOfTime(1.5f)->track(), second);
  EXPECT_FALSE(timeline.editToRightOfTime(2.5f)) << "the point at the very end is never answered";
  EXPECT_EQ(timeline.editsAtTime(1.0f).size(), 2u);
  EXPECT_EQ(timeline.editsAtTime(2.0f).size(), 1u);
  EXPECT_EQ(timeline.editWithin(0.3f, 2.9f), first->sequencedClips().back());

  // Edits go only to the tracks selected for editing.
  second->wasClicked();
  timeline.addEditsAtTime(0.5f);
  EXPECT_EQ(first->sequencedClips().size(), 5u);
  EXPECT_EQ(second->sequencedClips().size(), 7u);
  timeline.cutFrom(0.5f, 1.5f);
  EXPECT_FLOAT_EQ(second->totalLengthInSeconds(), 1.0f);
  EXPECT_FLOAT_EQ(first->totalLengthInSeconds(), 3.0f);
}

TEST(Timeline, LayoutsAndHitTesting) {
  Timeline timeline;
  auto track = std::make_shared<FloatValueTrack>();
  track->setTimelineHeight(30.0);
  timeline.addTrack(track);
  const Rect2D bounds{0, 0, 400, 300};
  EXPECT_EQ(timeline.headerRowsInView(bounds),
            (std::vector<Rect2D>{{5, 20, 390, 16}, {5, 41, 390, 30}}));
  EXPECT_EQ(timeline.trackRowsInView(bounds),
            (std::vector<Rect2D>{{0, 0, 400, 16}, {0, 21, 400, 30}}));
  timeline.trackViewWasClicked(bounds, {10, 50});
  EXPECT_TRUE(track->isSelectedForEditing());
  timeline.trackViewWasClicked(bounds, {10, 38});  // in the gap
  EXPECT_TRUE(track->isSelectedForEditing());
  EXPECT_EQ(timeline.trackForCoordinates({10, 21}, bounds), track);
  EXPECT_FALSE(timeline.trackForCoordinates({10, 18}, bounds));
  const Rect2D offset{7, 9, 200, 100};
  EXPECT_EQ(timeline.rectForTrack(*track, offset), (Rect2D{7, 9, 200, 30}));
  EXPECT_TRUE(timeline.rectForTrack(FloatValueTrack(), offset).isEmpty());
}

TEST(Timeline, ObjectsOfferTheirAnimatableProperties) {
  const auto offered = [](const std::shared_ptr<Animatable3DObject>& object) {
    std::vector<std::shared_ptr<TimelineTrack>> tracks;
    object->getAnimatablePropsInArray(tracks);
    std::vector<std::string> out;
    for (const auto& track : tracks) {
      EXPECT_EQ(track->theObject(), object);
      out.push_back(std::string(track->className()) + " " + track->managedKey() + " " +
                    track->title());
    }
    return out;
  };
  using List = std::vector<std::string>;
  EXPECT_EQ(offered(std::make_shared<Layer>()), (List{"AffineTrack  Transform"}));
  EXPECT_EQ(offered(std::make_shared<AnimatedLayer>()),
            (List{"AffineTrack  Transform", "TimelineTrack frame Time"}));
  EXPECT_EQ(offered(std::make_shared<PointLayer>()),
            (List{"AffineTrack  Transform", "FloatValueTrack pointSize Point Size",
                  "FloatValueTrack opacity Opacity", "FloatValueTrack bucketLimit Bucket Limit"}));
  EXPECT_EQ(offered(std::make_shared<Sphere>()),
            (List{"AffineTrack  Transform", "FloatValueTrack size Size"}));
  EXPECT_EQ(offered(std::make_shared<Camera>()),
            (List{"AffineTrack  Transform", "FloatValueTrack fieldOfView Field Of View",
                  "FloatValueTrack zNear Near Z Plane", "FloatValueTrack zFar Far Z Plane"}));
  EXPECT_EQ(offered(std::make_shared<CameraField>()),
            (List{"AffineTrack  Transform", "FloatValueTrack frustumLength Frustum Length",
                  "FloatValueTrack imageOpacity Image Opacity"}));
}

// A point layer's size and a camera's field of view on float tracks, the
// layer's transform following a SLERP path: applied, undone, archived.
TEST(Timeline, AnimatesAScenePropertyByPropertyAndSurvivesTheArchive) {
  MyDocument document;
  auto layer = std::make_shared<PointLayer>();
  auto camera = std::make_shared<Camera>();
  auto path = std::make_shared<SLERPCameraPath>();
  path->setToTranslate(Vector3::vectorWithXYZ(10, 0, 0));
  document.addLayer(layer);
  document.addLayer(path);
  document.undoManager().removeAllActions();

  const auto timelineObject = document.timeline();
  Timeline& timeline = *timelineObject;
  std::vector<std::shared_ptr<TimelineTrack>> offered;
  layer->getAnimatablePropsInArray(offered);
  camera->getAnimatablePropsInArray(offered);
  auto transform = std::dynamic_pointer_cast<AffineTrack>(offered[0]);
  auto size = std::dynamic_pointer_cast<FloatValueTrack>(offered[1]);
  auto fov = std::dynamic_pointer_cast<FloatValueTrack>(offered[5]);
  ASSERT_TRUE(transform && size && fov);
  ASSERT_EQ(fov->title(), "Field Of View");
  for (const auto& track : {offered[0], offered[1], offered[5]}) {
    timeline.addTrack(track);
    track->addDefaultClipAtTime(0.0f, 4.0f);
  }
  dynamic_cast<AnimatedValueClip&>(*size->sequencedClips()[1]).setValueEnd(9.0f);
  dynamic_cast<AnimatedValueClip&>(*fov->sequencedClips()[1]).setValueEnd(60.0f);
  dynamic_cast<AffineClip&>(*transform->sequencedClips()[1]).setPath(path);

  const float initialSize = layer->pointSize();
  timeline.applyForTime(2.0f);
  document.undoManager().closeEventGroup();  // as the run loop does after each playback step
  EXPECT_FLOAT_EQ(layer->pointSize(), (initialSize + 9.0f) / 2);
  EXPECT_FLOAT_EQ(camera->fieldOfView(), 45.0f);
  std::array<double, 3> moved{};
  layer->animationTransform()->getTranslation(moved);
  EXPECT_NEAR(moved[0], 5.0, 1e-6);
  timeline.applyForTime(3.0f);
  EXPECT_FLOAT_EQ(layer->pointSize(), initialSize + (9.0f - initialSize) * 0.75f);
  // Animation is not an edit: the values reach the layer, the undo history
  // stays empty.
  EXPECT_FALSE(document.undoManager().canUndo());
  timeline.applyForTime(4.0f);
  EXPECT_FLOAT_EQ(layer->pointSize(), initialSize);
  EXPECT_EQ(layer->animationTransform()->mx(), AffineTransform().mx());

  testing::TopLevelArchive archive([&](KeyedArchiver& coder) {
    coder.encodeList(std::vector<ObjectPtr>{layer, path, camera}, "layers");
    coder.encodeObject(timelineObject, "timeline");
  });
  ASSERT_TRUE(archive.coder);
  const auto objects = archive.coder->decodeListForKey("layers");
  const auto back = archive.coder->decodeObjectOfClassForKey<Timeline>("timeline");
  ASSERT_TRUE(objects && back);
  ASSERT_EQ(back->tracks().size(), 4u) << "no second ruler";
  EXPECT_EQ(back->tracks()[1]->theObject(), (*objects)[0]);
  EXPECT_EQ(back->tracks()[3]->theObject(), (*objects)[2]);
  const auto& clip = dynamic_cast<AffineClip&>(*back->tracks()[1]->sequencedClips()[1]);
  EXPECT_EQ(clip.path(), (*objects)[1]);
  back->applyForTime(2.0f);
  EXPECT_FLOAT_EQ(std::dynamic_pointer_cast<Camera>((*objects)[2])->fieldOfView(), 45.0f);
}

}  // namespace
}  // namespace cloudreel
