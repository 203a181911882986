#include "cli/demo_command.h"

#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <optional>
#include <system_error>
#include <vector>

#include "camera/camera.h"
#include "camera/camera_field.h"
#include "camera/discrete_camera_path.h"
#include "camera/scene_camera.h"
#include "camera/source_camera.h"
#include "cli/demo_scene.h"
#include "cli/document_input.h"
#include "cli/point_cloud_input.h"
#include "cli/render_command.h"
#include "cli/render_plan.h"
#include "geometry/vector3.h"
#include "platform/atomic_file.h"
#include "platform/color.h"
#include "platform/file_location.h"
#include "render/gl/gl_context.h"
#include "render/gl/image.h"
#include "render/offline_gl_renderer.h"
#include "render/opengl_scene.h"
#include "render/render_properties_controller.h"
#include "scene/animated_card.h"
#include "scene/light_source.h"
#include "scene/my_document.h"
#include "scene/ocean_fft.h"
#include "scene/point_3d.h"
#include "scene/point_layer.h"
#include "scene/sphere.h"
#include "timeline/affine_clip.h"
#include "timeline/float_clips.h"
#include "timeline/float_value_track.h"
#include "timeline/render_run.h"
#include "timeline/spline.h"
#include "timeline/timeline.h"
#include "timeline/timeline_clip.h"
#include "timeline/timeline_track.h"

namespace cloudreel::cli {

namespace {

namespace fs = std::filesystem;

// The timeline: short enough that a software renderer draws it in well
// under a minute, long enough to see the flight.
constexpr int kFramesPerSecond = 25;
constexpr int kFlightFrames = 60;
constexpr float kFlightSeconds = static_cast<float>(kFlightFrames) / kFramesPerSecond;
// The flight path holds several poses a timeline frame, so no two rendered
// frames (whose path times round differently) ever share a pose.
constexpr int kPosesPerFrame = 4;
// The point size (pixels) and bucket limit the flight ends with, which are
// also the layer's own values outside the ramps.
constexpr float kPointSize = 2.0f;
constexpr float kBucketLimit = 1.0f;
// What the ramps start from: a thinned cloud of bigger points, which also
// draws much faster, filling in as the camera comes down.
constexpr float kStartPointSize = 4.0f;
constexpr float kStartBucketLimit = 0.08f;
// The photographs are drawn with the points at this size in pixels.
constexpr float kPhotographPointSize = 2.0f;

using Clock = std::chrono::steady_clock;

double secondsSince(Clock::time_point start) {
  return std::chrono::duration<double>(Clock::now() - start).count();
}

// One line a step on standard output, at once, so a slow step shows which
// one it is.
void reportStep(std::string_view line, Clock::time_point start) {
  std::fputs(fmt::format("{} ({:.2f} s)\n", line, secondsSince(start)).c_str(), stdout);
  std::fflush(stdout);
}

void fail(Error* error, std::string message) {
  setError(error, "cloudreel", 1, std::move(message));
}

// What this run made, removed again unless the demo is complete: a
// failure leaves the folder as it was, not a bundle without photographs.
// Files and folders that were there before are never removed.
class MadeHere {
 public:
  ~MadeHere() {
    if (keep_) {
      return;
    }
    for (auto it = made_.rbegin(); it != made_.rend(); ++it) {
      std::error_code ignored;
      fs::remove(*it, ignored);  // a folder only when empty
    }
  }
  MadeHere() = default;
  MadeHere(const MadeHere&) = delete;
  MadeHere& operator=(const MadeHere&) = delete;

  // Records the path when nothing is there yet; call before making it.
  void willMake(const fs::path& path) {
    std::error_code ec;
    if (!fs::exists(fs::symlink_status(path, ec))) {
      made_.push_back(path);
    }
  }
  [[nodiscard]] bool makeFolder(const fs::path& folder, Error* error) {
    std::error_code ec;
    if (fs::is_directory(folder, ec)) {
      return true;
    }
    // Each missing ancestor is recorded, outermost first.
    std::vector<fs::path> missing;
    for (fs::path p = folder; !p.empty() && !fs::exists(fs::symlink_status(p, ec));
         p = p.parent_path()) {
      missing.push_back(p);
      if (p == p.parent_path()) {
        break;
      }
    }
    made_.insert(made_.end(), missing.rbegin(), missing.rend());
    fs::create_directories(folder, ec);
    if (ec) {
      fail(error, fmt::format("cannot make the folder {}: {}", folder.string(), ec.message()));
      return false;
    }
    return true;
  }
  void keep() { keep_ = true; }

 private:
  std::vector<fs::path> made_;
  bool keep_ = false;
};

// --- the steps

[[nodiscard]] bool writeReconstruction(const DemoScene& scene, const fs::path& root, MadeHere& made,
                                       Error* error) {
  if (!made.makeFolder(root / "bundle", error) || !made.makeFolder(root / "images", error)) {
    return false;
  }
  made.willMake(root / "bundle" / "bundle.out");
  if (!writeBundleFile(scene, root / "bundle" / "bundle.out", error)) {
    return false;
  }
  const std::string list = photographListText(scene.cameras.size());
  made.willMake(root / "list.txt");
  // The atomic write's error names the file.
  return writeFileAtomically(
      root / "list.txt", {reinterpret_cast<const std::uint8_t*>(list.data()), list.size()}, error);
}

// The reconstruction as `cloudreel import --link` makes it: the bundle
// layer, linked to its file, and its camera field.
std::shared_ptr<PointLayer> importReconstruction(const fs::path& bundle, const DemoScene& scene,
                                                 Error* error) {
  std::shared_ptr<PointLayer> layer = openPointCloud(bundle, PointFileKind::Bundler, 1, error);
  if (!layer) {
    return nullptr;
  }
  layer->setOriginalURL(absolutePath(bundle));
  layer->setFileStoredAsLink(true);
  layer->setIsModified(false);
  const auto field = layer->childLayers().empty()
                         ? nullptr
                         : std::dynamic_pointer_cast<CameraField>(layer->childLayers().front());
  // Written a moment ago, so anything else is a fault of the writer.
  if (layer->nPoints() != static_cast<std::int32_t>(scene.points.size()) || !field ||
      field->cameras().size() != scene.cameras.size()) {
    fail(error, fmt::format("{} reads back as {} points and {} cameras instead of {} and {}",
                            bundle.string(), layer->nPoints(), field ? field->cameras().size() : 0,
                            scene.points.size(), scene.cameras.size()));
    return nullptr;
  }
  return layer;
}

// Photographs the scene through each imported camera: the document holds
// the reconstruction alone by now. A source camera takes its field of view
// from its photograph, which does not exist yet, so each picture is drawn
// through a plain camera in the same pose with the pinhole field of view
// of its focal length.
[[nodiscard]] bool takePhotographs(MyDocument& document, PointLayer& layer, const fs::path& root,
                                   MadeHere& made, Error* error) {
  auto& field = static_cast<CameraField&>(*layer.childLayers().front());
  const std::shared_ptr<gl::GLContext> shared = document.sharedGLContext();
  if (!shared) {
    fail(error, "cannot photograph the scene without an OpenGL context");
    return false;
  }
  const double fieldOfView =
      photographFieldOfView(static_cast<const SourceCamera&>(*field.cameras().front()).focal());
  Error reason;
  const auto renderer = OfflineGLRenderer::initWithSceneContextExportDepth(
      OpenGLScene::initWithWidthHeightFieldOfViewZNearZFar(kPhotographWidth, kPhotographHeight,
                                                           fieldOfView, 0.1f, 200.0f),
      *shared, false, &reason);
  if (!renderer) {
    fail(error, "cannot photograph the scene: " + reason.message);
    return false;
  }
  layer.setPointSize(kPhotographPointSize);
  layer.setBucketLimit(1.0f);
  gl::RgbaImage frame;
  for (std::size_t i = 0; i < field.cameras().size(); ++i) {
    const Camera& source = *field.cameras()[i];
    const auto centre = source.translation();
    const auto camera = Camera::initWithMatrixTranslate(source.inertialToObject()->mx(),
                                                        {centre->x(), centre->y(), centre->z()});
    camera->setFieldOfView(static_cast<float>(fieldOfView));
    camera->setAspect(static_cast<float>(kPhotographWidth) / kPhotographHeight);
    camera->setZNear(0.1f);
    camera->setZFar(200.0f);
    bool drawn = false;
    {
      const gl::CurrentContext current(renderer->context(), &reason);
      if (current) {
        renderer->scene().setupFrustumForCamera(*camera);
        renderer->renderColorFrameOfDocumentForCamera(document, camera);
        // With its alpha, which the sky fills in.
        drawn = renderer->readColorFrame(frame, &reason);
      }
    }
    if (!drawn) {
      fail(error, "cannot photograph the scene: " + reason.message);
      return false;
    }
    const std::vector<std::uint8_t> jpeg =
        encodePhotograph(frame.pixels, frame.width, frame.height);
    const fs::path path = root / photographName(i);
    made.willMake(path);
    if (jpeg.empty()) {
      fail(error, fmt::format("cannot write {}: the picture does not encode", path.string()));
      return false;
    }
    if (!writeFileAtomically(path, jpeg, error, Durability::Unsynced)) {
      return false;
    }
    // Now that the photograph is there the camera reads its size, and with
    // it its aspect and field of view.
    if (auto* photographed = dynamic_cast<SourceCamera*>(field.cameras()[i].get())) {
      photographed->setImagePath(path);
    }
  }
  return true;
}

std::shared_ptr<Spline> splineThrough(std::initializer_list<std::array<double, 3>> knots) {
  // Each knot: x, y and the slope of both its handles.
  std::vector<std::shared_ptr<SplinePoint>> points;
  for (const auto& [x, y, slope] : knots) {
    auto point = SplinePoint::initWithPoint({x, y});
    point->setLeftTangentToPoint({x - 0.1, y - 0.1 * slope});
    point->setRightTangentToPoint({x + 0.1, y + 0.1 * slope});
    points.push_back(std::move(point));
  }
  auto spline = std::make_shared<Spline>();
  spline->setPoints(std::move(points));
  return spline;
}

// A float track of the layer as the timeline window offers it (by title),
// ramping from one value to the other over the flight along the spline.
std::shared_ptr<TimelineTrack> rampTrack(const std::shared_ptr<PointLayer>& layer,
                                         std::string_view title, float from, float to,
                                         std::shared_ptr<Spline> spline) {
  std::vector<std::shared_ptr<TimelineTrack>> offered;
  layer->getAnimatablePropsInArray(offered);
  std::shared_ptr<TimelineTrack> track;
  for (const auto& candidate : offered) {
    if (candidate->title() == title) {
      track = candidate;
    }
  }
  if (!track) {
    return nullptr;
  }
  auto ramp = std::make_shared<AnimatedValueClip>(0.0f, kFlightSeconds, from, to);
  ramp->setRampType(static_cast<std::int32_t>(RampType::CustomSpline));
  ramp->setSpline(std::move(spline));
  track->justAddClip(SingleValueClip::controlPointWithTime(0.0f, from));
  track->justAddClip(std::move(ramp));
  track->justAddClip(SingleValueClip::controlPointWithTime(kFlightSeconds, to));
  return track;
}

// Adds the flight, the objects, the light and the timeline to a document
// that holds the reconstruction.
[[nodiscard]] bool animate(MyDocument& document, const std::shared_ptr<PointLayer>& layer,
                           Error* error) {
  // The flight: a path of our own, as a matrix path file would bring it in.
  // Its frame rate makes it exactly as long as the flight's clip.
  auto flight = std::make_shared<DiscreteCameraPath>(kFramesPerSecond * kPosesPerFrame);
  flight->setName("Flight");
  std::vector<CameraPathRecord> records;
  for (const DemoPose& pose : flightPoses(kFlightFrames * kPosesPerFrame)) {
    CameraPathRecord record;
    record.position = pose.position;
    record.matrix = AffineTransform::kIdentity;
    for (std::size_t column = 0; column < 3; ++column) {
      for (std::size_t row = 0; row < 3; ++row) {
        record.matrix[4 * column + row] = pose.axes[column][row];
      }
    }
    records.push_back(record);
  }
  flight->setPoints(std::move(records));
  document.addLayer(flight);
  document.addCameraPath(flight);

  const DemoLandmarks landmarks = demoLandmarks();
  auto ornament = std::make_shared<Sphere>();
  ornament->setShape(Sphere::kShapeSphere);
  ornament->setSize(static_cast<float>(landmarks.ornamentSize));
  ornament->setColor(Color::colorWithRGBA(0.95f, 0.74f, 0.22f, 1.0f));
  ornament->objectToWorld()->setTranslation(landmarks.ornament);
  document.addLayer(ornament);
  auto marker = std::make_shared<Point3D>();
  marker->setName("Front Door");
  marker->objectToWorld()->setTranslation(landmarks.marker);
  document.addLayer(marker);
  document.lightSource()->objectToWorld()->setTranslation(landmarks.light);

  // The scene camera rests where the flight ends (the origin, unturned):
  // a track's transform is applied on top of the camera's own pose, and
  // after the last span the camera shows that pose.
  const std::shared_ptr<SceneCamera>& camera = document.sceneCamera();
  camera->setTranslate(Vector3(0.0, 0.0, 0.0));
  camera->setFieldOfView(40.0f);
  camera->setZNear(0.2f);
  camera->setZFar(150.0f);

  // Outside their ramps float tracks set the value they were made with.
  layer->setPointSize(kPointSize);
  layer->setBucketLimit(kBucketLimit);

  const std::shared_ptr<Timeline>& timeline = document.timeline();
  timeline->setFps(kFramesPerSecond);
  std::vector<std::shared_ptr<TimelineTrack>> offered;
  camera->getAnimatablePropsInArray(offered);
  const std::shared_ptr<TimelineTrack> fly = offered.empty() ? nullptr : offered.front();
  // A bucket ramp that stays low for the first half (cheap frames of a thin
  // cloud) and fills in towards the end; point sizes shrink as it fills.
  const auto buckets =
      rampTrack(layer, "Bucket Limit", kStartBucketLimit, kBucketLimit,
                splineThrough({{0.0, 0.0, 0.0}, {0.55, 0.12, 0.3}, {1.0, 1.0, 0.0}}));
  const auto sizes = rampTrack(layer, "Point Size", kStartPointSize, kPointSize,
                               splineThrough({{0.0, 0.0, 0.0}, {0.6, 0.85, 0.6}, {1.0, 1.0, 0.0}}));
  if (!fly || !buckets || !sizes ||
      !fly->insertClipInSequenceAt(std::make_shared<AffineClip>(flight, 0.0f, kFlightSeconds),
                                   0.0f)) {
    fail(error, "cannot animate the demo: the scene offers none of its usual tracks");
    return false;
  }
  timeline->addTrack(fly);
  timeline->addTrack(sizes);
  timeline->addTrack(buckets);
  return true;
}

// An ocean below the scene, reaching past the ground on every side, whose
// waves roll through the flight; and, standing to the right of the house,
// a card showing the first camera's photograph.
void addOceanAndCard(MyDocument& document, const fs::path& root) {
  const DemoLandmarks landmarks = demoLandmarks();
  auto ocean = std::make_shared<OceanFFT>();
  ocean->setPatchSize(80.0f);
  ocean->setWindSpeed(7.0f);
  ocean->setWindDirection(30.0f);
  // Calm enough that no crest reaches the ground.
  ocean->setAmplitude(0.0015f);
  ocean->objectToWorld()->setTranslation(landmarks.oceanCentre);
  document.addLayer(ocean);
  auto waves = std::make_shared<TimelineTrack>(ocean, "frame", "Time");
  waves->addDefaultClipAtTime(0.0f, kFlightSeconds);
  document.timeline()->addTrack(waves);

  auto card = std::make_shared<AnimatedCard>();
  card->setName("Photograph");
  card->setImagePath(absolutePath(root / photographName(0)).string());
  card->setCardHeight(2.4f);
  card->objectToWorld()->setTranslation(landmarks.card);
  document.addLayer(card);
}

int failed(const Error& error) {
  reportFailure(error.message);
  return 1;
}

}  // namespace

CLI::App* addDemoCommand(CLI::App& app, DemoOptions& options) {
  CLI::App* command = app.add_subcommand(
      "demo",
      "Make the built-in demo: a synthetic reconstruction with its cameras and photographs, "
      "a document animating it, and its frames.");
  command->add_option("DIR", options.folder, "the folder to make it in (made if missing)")
      ->capture_default_str();
  command->add_flag("--no-render", options.noRender,
                    "make the reconstruction and the document but render no frames");
  command->add_option("--size", options.size, "the frames' size: a preset (480p, 720p, ...) or WxH")
      ->capture_default_str();
  command->add_option("--points", options.points, "how many points the reconstruction has")
      ->check(CLI::Range(100, 20'000'000))
      ->capture_default_str();
  command->footer(
      "DIR gets bundle/bundle.out and list.txt (the reconstruction in the bundle format), "
      "images/ (the cameras' photographs), demo.reel (the document) and frames/ (the "
      "rendered timeline, numbered TIFF files). When a step fails, what this run made is "
      "removed again; a render that fails keeps the finished document.");
  return command;
}

int runDemoCommand(const DemoOptions& options) {
  const Clock::time_point begin = Clock::now();
  int width = 0;
  int height = 0;
  std::string why;
  if (!options.noRender && !parseRenderSize(options.size, width, height, why)) {
    reportFailure("demo: " + why);
    return 1;
  }
  const fs::path root = options.folder;
  MadeHere made;
  Error error;
  if (!made.makeFolder(root, &error)) {
    return failed(error);
  }

  Clock::time_point start = Clock::now();
  const DemoScene scene = makeDemoScene(static_cast<std::size_t>(options.points));
  reportStep(fmt::format("scene: {} points, {} cameras", scene.points.size(), scene.cameras.size()),
             start);

  start = Clock::now();
  if (!writeReconstruction(scene, root, made, &error)) {
    return failed(error);
  }
  const fs::path bundle = root / "bundle" / "bundle.out";
  reportStep(fmt::format("bundle: {} and {}", bundle.string(), (root / "list.txt").string()),
             start);

  start = Clock::now();
  prepareForDocuments();
  MyDocument document;
  const std::shared_ptr<PointLayer> layer = importReconstruction(bundle, scene, &error);
  if (!layer) {
    return failed(error);
  }
  document.addLayer(layer);
  document.addCameraPath(std::static_pointer_cast<CameraPath>(layer->childLayers().front()));
  reportStep(fmt::format("import: {} read back", bundle.string()), start);

  start = Clock::now();
  if (!takePhotographs(document, *layer, root, made, &error)) {
    return failed(error);
  }
  reportStep(fmt::format("photographs: {} of {}x{} in {}", scene.cameras.size(), kPhotographWidth,
                         kPhotographHeight, (root / "images").string()),
             start);

  start = Clock::now();
  const fs::path documentPath = root / "demo.reel";
  made.willMake(documentPath);
  if (!animate(document, layer, &error)) {
    return failed(error);
  }
  addOceanAndCard(document, root);
  if (!writeDocument(document, documentPath, &error)) {
    return failed(error);
  }
  made.keep();
  reportStep(fmt::format("document: {}", documentPath.string()), start);

  const fs::path frames = root / "frames";
  if (options.noRender) {
    std::fputs(fmt::format("frames: not rendered (cloudreel render {} --out {} renders them)\n",
                           documentPath.string(), frames.string())
                   .c_str(),
               stdout);
  } else {
    start = Clock::now();
    RenderCommandOptions render;
    render.document = documentPath.string();
    render.outputFolder = frames.string();
    render.size = options.size;
    const int status = renderDocument(document, render);
    if (status != kRenderExitOk) {
      return status;
    }
    reportStep(
        fmt::format("frames: {} at {} in {}", wholeTimelineRange(*document.timeline()).frameCount(),
                    options.size, frames.string()),
        start);
  }
  reportStep(fmt::format("demo: made in {}; open {}", root.string(), documentPath.string()), begin);
  return 0;
}

}  // namespace cloudreel::cli
