// Applying a timeline, as playback and a render do once per frame: 100
// tracks of 50 clips each (float ramps on point layers and spheres, path
// clips on layer transforms, frame tracks on animated layers), applied at
// 10,000 times spread over its length. Reported per whole-timeline
// application and as track applications per second.
//
// The objects are not in a document, so no undo is registered; each float
// write still goes through key-value coding and notifies its observers
// (one per object here, as a panel would have).

#include <benchmark/benchmark.h>

#include <memory>
#include <vector>

#include "camera/slerp_camera_path.h"
#include "platform/log.h"
#include "scene/layer.h"
#include "scene/point_layer.h"
#include "scene/sphere.h"
#include "timeline/affine_clip.h"
#include "timeline/affine_track.h"
#include "timeline/float_clips.h"
#include "timeline/float_value_track.h"
#include "timeline/timeline.h"

namespace cloudreel {
namespace {

constexpr int kTracks = 100;
constexpr int kClipsPerTrack = 50;
constexpr int kTimes = 10'000;
constexpr float kClipSeconds = 0.4f;

struct Scene {
  std::vector<ObjectPtr> objects;
  std::vector<std::unique_ptr<CallbackObserver>> observers;
  std::shared_ptr<Timeline> timeline = std::make_shared<Timeline>();
  std::shared_ptr<SLERPCameraPath> path = std::make_shared<SLERPCameraPath>();
  long notifications = 0;

  void observe(const ObjectPtr& object, const char* key) {
    observers.push_back(
        std::make_unique<CallbackObserver>([this](auto, auto&, auto&, auto) { ++notifications; }));
    object->addObserver(*observers.back(), key, ObservingOptions::New, "");
  }
};

// Control points and spans end to end from 0; ramps alternate their shape.
template <class Span, class Point>
void fill(TimelineTrack& track, Span makeSpan, Point makePoint) {
  float t = 0.0f;
  track.justAddClip(makePoint(t));
  for (int i = 0; i < kClipsPerTrack; ++i) {
    auto span = makeSpan(t, i);
    span->setRampType(i % 4);
    track.justAddClip(std::move(span));
    t += kClipSeconds;
    track.justAddClip(makePoint(t));
  }
}

std::unique_ptr<Scene> makeScene() {
  auto scene = std::make_unique<Scene>();
  scene->path->setToTranslate(Vector3::vectorWithXYZ(3, 4, 5));
  scene->path->setToRotate(Vector3::vectorWithXYZ(0, 90, 0));
  for (int n = 0; n < kTracks; ++n) {
    std::shared_ptr<TimelineTrack> track;
    if (n % 10 < 7) {
      // Float ramps: point sizes and sphere sizes.
      ObjectPtr object;
      const char* key = n % 2 ? "pointSize" : "size";
      object = n % 2 ? ObjectPtr(std::make_shared<PointLayer>()) : std::make_shared<Sphere>();
      auto floats = std::make_shared<FloatValueTrack>(object, key, key);
      fill(
          *floats,
          [](float t, int i) {
            return std::make_shared<AnimatedValueClip>(t, kClipSeconds, i, i + 1.0f);
          },
          [](float t) { return SingleValueClip::controlPointWithTime(t, t); });
      scene->observe(object, key);
      scene->objects.push_back(object);
      track = floats;
    } else if (n % 10 < 9) {
      // Layer transforms following the path.
      auto layer = std::make_shared<Layer>();
      auto affine = std::make_shared<AffineTrack>(layer, "Transform");
      fill(
          *affine,
          [&](float t, int) { return std::make_shared<AffineClip>(scene->path, t, kClipSeconds); },
          [](float t) { return AffineClip::controlPointWithTime(t); });
      scene->objects.push_back(layer);
      track = affine;
    } else {
      auto layer = std::make_shared<AnimatedLayer>();
      track = std::make_shared<TimelineTrack>(layer, "frame", "Time");
      fill(
          *track, [](float t, int) { return std::make_shared<TimelineClip>(t, kClipSeconds); },
          [](float t) { return TimelineClip::controlPointWithTime(t); });
      scene->objects.push_back(layer);
    }
    scene->timeline->addTrack(std::move(track));
  }
  return scene;
}

void BM_ApplyTimeline(benchmark::State& state) {
  setLogSink([](std::string_view) {});
  const auto scene = makeScene();
  Timeline& timeline = *scene->timeline;
  const float step = timeline.totalLengthInSeconds() / kTimes;
  for (auto _ : state) {
    for (int i = 0; i < kTimes; ++i) {
      timeline.applyForTime(static_cast<float>(i) * step);
    }
  }
  benchmark::DoNotOptimize(scene->notifications);
  state.SetItemsProcessed(state.iterations() * kTimes * kTracks);
  state.counters["timeline_applies"] = benchmark::Counter(
      static_cast<double>(state.iterations()) * kTimes, benchmark::Counter::kIsRate);
  setLogSink({});
}
BENCHMARK(BM_ApplyTimeline)->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace cloudreel

BENCHMARK_MAIN();
