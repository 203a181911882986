// Point drawing at 1920 × 1080: building the cached drawing of a cloud,
// frames per second replaying it, and what a bucket-limit change costs; the
// same cloud as a display list of immediate-mode points for comparison.
//
// The cloud fills the frame: points uniform in the unit cube under an
// orthographic projection, luck uniform over 0-254 as after re-randomising
// with exponent 1.
#include <benchmark/benchmark.h>
#include <epoxy/gl.h>

#include <cstdio>
#include <memory>
#include <optional>
#include <string>

#include "random_cloud.h"
#include "render/gl/display_list.h"
#include "render/gl/egl_context.h"
#include "render/gl/framebuffer.h"
#include "render/render_options.h"
#include "scene/point_layer.h"

namespace cloudreel {
namespace {

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;

struct Setup {
  std::unique_ptr<gl::EglContext> context;
  std::optional<gl::Framebuffer> framebuffer;
  std::string error;

  Setup() {
    Error failure;
    context = gl::EglContext::createHeadless(&failure);
    if (!context || !context->makeCurrent(&failure) ||
        !(framebuffer = gl::Framebuffer::create(kWidth, kHeight, &failure))) {
      error = failure.message;
      return;
    }
    std::fprintf(stderr, "context: %s\n", context->description().c_str());
  }
};

Setup& setup() {
  static Setup instance;
  return instance;
}

// One cloud per size for the whole program.
std::shared_ptr<PointLayer> cloudOf(std::int32_t n) {
  static std::shared_ptr<PointLayer> layer;
  if (layer && layer->nPoints() == n) {
    return layer;
  }
  layer.reset();
  layer = bench::randomCloud(n);
  return layer;
}

bool ready(benchmark::State& state) {
  if (!setup().error.empty()) {
    state.SkipWithError(setup().error.c_str());
    return false;
  }
  return true;
}

// Clears the frame, draws, and waits for the pixels.
template <typename Draw>
void frame(Draw&& draw) {
  const gl::FramebufferBinding binding(*setup().framebuffer);
  glClearColor(0.0f, 0.0f, 0.0f, 1.0f);
  glClear(GL_COLOR_BUFFER_BIT | GL_DEPTH_BUFFER_BIT);
  glEnable(GL_DEPTH_TEST);
  glMatrixMode(GL_PROJECTION);
  glLoadIdentity();
  glOrtho(-1, 1, -1, 1, -2, 2);
  glMatrixMode(GL_MODELVIEW);
  glLoadIdentity();
  draw();
  glFinish();
}

void countFrames(benchmark::State& state) {
  state.counters["frames/s"] =
      benchmark::Counter(static_cast<double>(state.iterations()), benchmark::Counter::kIsRate);
}

// Sorting the records by luck and uploading them; nothing is rasterised
// (limit 0 draws no point).
void BM_BuildPointDrawing(benchmark::State& state) {
  if (!ready(state)) {
    return;
  }
  auto layer = cloudOf(static_cast<std::int32_t>(state.range(0)));
  layer->setBucketLimit(0.0f);
  for (auto _ : state) {
    layer->invalidateOpenGLDisplayLists();
    frame([&] { layer->drawGLWithOptions({}); });
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(BM_BuildPointDrawing)
    ->Arg(1'000'000)
    ->Arg(10'000'000)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();

// A steady frame: the cached drawing replayed at limit 1 (every point) or
// 0.5 (half of them).
void BM_DrawPoints(benchmark::State& state) {
  if (!ready(state)) {
    return;
  }
  auto layer = cloudOf(static_cast<std::int32_t>(state.range(0)));
  layer->setBucketLimit(static_cast<float>(state.range(1)) / 100.0f);
  frame([&] { layer->drawGLWithOptions({}); });
  for (auto _ : state) {
    frame([&] { layer->drawGLWithOptions({}); });
  }
  countFrames(state);
}
BENCHMARK(BM_DrawPoints)
    ->Args({10'000'000, 100})
    ->Args({10'000'000, 50})
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();

// Every frame at another limit (0.50 and 0.51 alternately, thresholds 127
// and 130): a rebuild each frame, drawing about half of the points. Compare
// with BM_DrawPoints at 50.
void BM_BucketLimitChange(benchmark::State& state) {
  if (!ready(state)) {
    return;
  }
  auto layer = cloudOf(static_cast<std::int32_t>(state.range(0)));
  bool flip = false;
  for (auto _ : state) {
    layer->setBucketLimit(flip ? 0.51f : 0.50f);
    flip = !flip;
    frame([&] { layer->drawGLWithOptions({}); });
  }
  countFrames(state);
}
BENCHMARK(BM_BucketLimitChange)->Arg(10'000'000)->Unit(benchmark::kMillisecond)->UseRealTime();

// The alternative: every point as glColor4ub + glVertex3d in a display
// list, compiled (and drawn) once, then replayed.
void emitImmediate(const PointLayer& layer) {
  glBegin(GL_POINTS);
  for (const color_point& p : layer.colorPoints()) {
    if (p.luck < 255) {
      glColor4ub(p.r, p.g, p.b, 255);
      glVertex3d(p.x, p.y, p.z);
    }
  }
  glEnd();
}

void BM_DisplayListBuild(benchmark::State& state) {
  if (!ready(state)) {
    return;
  }
  auto layer = cloudOf(static_cast<std::int32_t>(state.range(0)));
  for (auto _ : state) {
    gl::DisplayList list;
    frame([&] { list.compile([&] { emitImmediate(*layer); }); });
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(BM_DisplayListBuild)->Arg(10'000'000)->Unit(benchmark::kMillisecond)->UseRealTime();

void BM_DisplayListDraw(benchmark::State& state) {
  if (!ready(state)) {
    return;
  }
  auto layer = cloudOf(static_cast<std::int32_t>(state.range(0)));
  gl::DisplayList list;
  frame([&] { list.compile([&] { emitImmediate(*layer); }); });
  for (auto _ : state) {
    frame([&] { list.call(); });
  }
  countFrames(state);
}
BENCHMARK(BM_DisplayListDraw)->Arg(10'000'000)->Unit(benchmark::kMillisecond)->UseRealTime();

}  // namespace
}  // namespace cloudreel

BENCHMARK_MAIN();
