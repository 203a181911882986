// Frames per second of an off-screen render at 1920 × 1080 through the
// document's drawing root, for documents of 1 and 10 million points, in
// the stages of a render frame: drawing only, drawing and reading the
// colour back, and the whole frame written (colour alone, colour and
// depth). The difference between the last two and the second is what
// writing the files costs. Each stage runs with the points drawn through
// OpenGL (mode 0) and on the CPU (mode 1); BM_RasterizeOnly times the CPU
// rasteriser alone, without OpenGL.
//
// CLOUDREEL_BENCH_DIR sets the folder for the frames (default the temporary
// folder); they are removed at the end.

#include <benchmark/benchmark.h>
#include <stdlib.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "bench_files.h"
#include "camera/camera.h"
#include "platform/application_defaults.h"
#include "platform/log.h"
#include "random_cloud.h"
#include "render/gl/egl_context.h"
#include "render/offline_gl_renderer.h"
#include "render/point_rasterizer.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"
#include "timeline/render_run.h"

namespace cloudreel {
namespace {

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;

struct Setup {
  std::filesystem::path folder;
  std::string error;

  Setup() {
    (void)useFactoryDefaultsInMemory();
    setLogSink([](std::string_view) {});
    std::string pattern = (bench::benchFolder() / "render_bench.XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr) {
      error = "no folder for the frames";
      return;
    }
    folder = pattern;
  }
  ~Setup() {
    std::error_code ignored;
    std::filesystem::remove_all(folder, ignored);
  }
};

Setup& setup() {
  static Setup instance;
  return instance;
}

// A document holding a cloud of n points in the cube [-1, 1]³, seen whole by
// a camera 3 units away; its renderer, with or without depth, writes into
// the bench folder.
struct Scene {
  MyDocument document;
  std::shared_ptr<Camera> camera = std::make_shared<Camera>();
  std::unique_ptr<OfflineGLRenderer> renderer;
  std::string error;

  Scene(std::int32_t n, bool depth, PointRasterization mode) {
    document.addLayer(bench::randomCloud(n, -3.0f));
    camera->setFieldOfView(45.0f);
    camera->setZNear(1.0f);
    camera->setZFar(10.0f);
    const auto context = document.sharedGLContext();
    Error failure;
    if (context) {
      renderer = OfflineGLRenderer::initWithSceneContextExportDepth(
          OpenGLScene::initWithWidthHeightFieldOfView(kWidth, kHeight, 45.0), *context, depth,
          &failure);
    }
    if (!renderer) {
      error = context ? failure.message : "no OpenGL context";
      return;
    }
    renderer->setOutputPath(setup().folder);
    renderer->setPointRasterization(mode);
    if (auto* egl = dynamic_cast<gl::EglContext*>(context.get())) {
      std::fprintf(stderr, "context: %s\n", egl->description().c_str());
    }
  }
};

// Documents are kept between benchmarks: making ten million points and
// building their drawing takes longer than several frames.
Scene& sceneOf(std::int32_t n, bool depth, PointRasterization mode) {
  static std::map<std::pair<std::int32_t, bool>, std::unique_ptr<Scene>> scenes;
  auto& scene = scenes[{n, depth}];
  if (!scene) {
    scenes.clear();
    scene = std::make_unique<Scene>(n, depth, mode);
  }
  scene->renderer->setPointRasterization(mode);
  return *scene;
}

PointRasterization modeOf(const benchmark::State& state) {
  return state.range(1) != 0 ? PointRasterization::Cpu : PointRasterization::OpenGL;
}

void countFrames(benchmark::State& state) {
  state.counters["frames/s"] =
      benchmark::Counter(static_cast<double>(state.iterations()), benchmark::Counter::kIsRate);
}

// Draws one colour frame, reading it back when asked.
void drawFrame(Scene& scene, bool readBack) {
  OfflineGLRenderer& renderer = *scene.renderer;
  const gl::CurrentContext current(renderer.context());
  renderer.scene().setupFrustumForCamera(*scene.camera);
  renderer.renderColorFrameOfDocumentForCamera(scene.document, scene.camera);
  if (readBack) {
    gl::RgbaImage image;
    (void)renderer.readColorFrame(image);
    benchmark::DoNotOptimize(image.pixels.data());
  }
}

template <typename Frame>
void run(benchmark::State& state, bool depth, Frame&& frame) {
  if (!setup().error.empty()) {
    state.SkipWithError(setup().error.c_str());
    return;
  }
  Scene& scene = sceneOf(static_cast<std::int32_t>(state.range(0)), depth, modeOf(state));
  if (!scene.renderer) {
    state.SkipWithError(scene.error.c_str());
    return;
  }
  // The first frame builds the cloud's drawing; it is not a render's
  // steady cost.
  drawFrame(scene, false);
  int n = 0;
  for (auto _ : state) {
    frame(scene, n++);
  }
  countFrames(state);
  state.counters["points/s"] = benchmark::Counter(
      static_cast<double>(state.iterations()) * static_cast<double>(state.range(0)),
      benchmark::Counter::kIsRate);
}

void BM_DrawOnly(benchmark::State& state) {
  run(state, false, [](Scene& scene, int) { drawFrame(scene, false); });
}

void BM_DrawAndReadBack(benchmark::State& state) {
  run(state, false, [](Scene& scene, int) { drawFrame(scene, true); });
}

void BM_WholeFrame(benchmark::State& state) {
  const bool depth = state.range(2) != 0;
  run(state, depth, [](Scene& scene, int n) {
    (void)scene.renderer->renderFrameOfDocumentForCamera(n % 4, scene.document, scene.camera);
  });
}

// A render run of eight frames, whose files are written on their own thread
// while the next frame is drawn: what `cloudreel render` does.
void BM_RenderRun(benchmark::State& state) {
  const bool depth = state.range(2) != 0;
  constexpr int kFrames = 8;
  run(state, depth, [&state](Scene& scene, int) {
    // A run owns its renderer and lets it go at its end, so each run gets
    // a new one (a context and framebuffer; the cloud's drawing is shared).
    RunLoop loop;
    bool done = false;
    RenderRun::Hooks hooks;
    hooks.prepareFrame = [&](int) { return scene.camera; };
    hooks.finished = [&](bool) { done = true; };
    auto renderer = OfflineGLRenderer::initWithSceneContextExportDepth(
        scene.renderer->scene(), *scene.document.sharedGLContext(),
        scene.renderer->isDepthRender());
    renderer->setOutputPath(setup().folder);
    renderer->setPointRasterization(modeOf(state));
    auto frames =
        RenderRun::create(scene.document, std::move(renderer), {-1, kFrames - 1}, hooks, loop);
    frames->start();
    (void)loop.runUntil([&] { return done; }, std::chrono::hours(1));
  });
  state.counters["frames/s"] = benchmark::Counter(static_cast<double>(state.iterations() * kFrames),
                                                  benchmark::Counter::kIsRate);
}

// The CPU rasteriser alone: the cloud projected into a cleared 1080p frame
// on every core, without OpenGL.
void BM_RasterizeOnly(benchmark::State& state) {
  const auto cloud = bench::randomCloud(static_cast<std::int32_t>(state.range(0)), -3.0f);
  std::vector<std::uint32_t> colour(std::size_t{kWidth} * kHeight);
  std::vector<std::uint32_t> depth(colour.size());
  PointRasterBatch batch;
  // The bench camera's projection: 45° across the 1080 rows, near 1, far 10.
  const float f = 1.0f / std::tan(22.5f * 3.14159265f / 180.0f);
  batch.projection = {f * kHeight / kWidth, 0, 0, 0, 0, f, 0, 0, 0, 0, -11.0f / 9.0f, -1, 0, 0,
                      -20.0f / 9.0f,        0};
  batch.modelView = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1};
  batch.viewport = {0, 0, kWidth, kHeight};
  batch.records = cloud->points();
  batch.count = static_cast<std::size_t>(cloud->nPoints());
  batch.luckThreshold = 255;
  PointRasterizer rasterizer;
  for (auto _ : state) {
    std::fill(colour.begin(), colour.end(), 0u);
    std::fill(depth.begin(), depth.end(), 0xffffffffu);
    (void)rasterizer.draw({kWidth, kHeight, colour.data(), depth.data()}, {&batch, 1});
  }
  state.counters["points/s"] =
      benchmark::Counter(static_cast<double>(state.iterations()) * static_cast<double>(batch.count),
                         benchmark::Counter::kIsRate);
}

// Arguments: points, 0 for OpenGL or 1 for the CPU, and for whole frames
// 1 when a depth image is written too.
void onePointMillion(benchmark::internal::Benchmark* b, bool withDepth) {
  for (int mode : {0, 1}) {
    for (int depth : withDepth ? std::vector{0, 1} : std::vector{0}) {
      b->Args(withDepth ? std::vector<std::int64_t>{1'000'000, mode, depth}
                        : std::vector<std::int64_t>{1'000'000, mode});
    }
  }
}
void tenMillion(benchmark::internal::Benchmark* b, bool withDepth) {
  for (int mode : {0, 1}) {
    for (int depth : withDepth ? std::vector{0, 1} : std::vector{0}) {
      b->Args(withDepth ? std::vector<std::int64_t>{10'000'000, mode, depth}
                        : std::vector<std::int64_t>{10'000'000, mode});
    }
  }
}

BENCHMARK(BM_RasterizeOnly)
    ->Arg(1'000'000)
    ->Arg(10'000'000)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime()
    ->MinTime(2);
BENCHMARK(BM_DrawOnly)->Apply([](auto* b) {
                        onePointMillion(b, false);
                      }) -> Unit(benchmark::kMillisecond) -> UseRealTime() -> MinTime(3);
BENCHMARK(BM_DrawAndReadBack)->Apply([](auto* b) {
                               onePointMillion(b, false);
                             }) -> Unit(benchmark::kMillisecond) -> UseRealTime() -> MinTime(3);
BENCHMARK(BM_WholeFrame)->Apply([](auto* b) {
                          onePointMillion(b, true);
                        }) -> Unit(benchmark::kMillisecond) -> UseRealTime() -> MinTime(3);
BENCHMARK(BM_RenderRun)->Apply([](auto* b) {
                         onePointMillion(b, true);
                       }) -> Unit(benchmark::kMillisecond) -> UseRealTime() -> MinTime(3);
BENCHMARK(BM_DrawOnly)->Apply([](auto* b) {
                        tenMillion(b, false);
                      }) -> Unit(benchmark::kMillisecond) -> UseRealTime() -> Iterations(3);
BENCHMARK(BM_DrawAndReadBack)->Apply([](auto* b) {
                               tenMillion(b, false);
                             }) -> Unit(benchmark::kMillisecond) -> UseRealTime() -> Iterations(3);
BENCHMARK(BM_WholeFrame)->Apply([](auto* b) {
                          tenMillion(b, true);
                        }) -> Unit(benchmark::kMillisecond) -> UseRealTime() -> Iterations(3);
BENCHMARK(BM_RenderRun)->Apply([](auto* b) {
                         tenMillion(b, true);
                       }) -> Unit(benchmark::kMillisecond) -> UseRealTime() -> Iterations(1);

}  // namespace
}  // namespace cloudreel

BENCHMARK_MAIN();
