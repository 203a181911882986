// Frames per second of the off-screen frame path at 1920 × 1080: clearing
// (the frame's drawing left out), reading colour and depth back, and writing
// both TIFF files; each stage alone and the whole frame.
#include <benchmark/benchmark.h>

#include <epoxy/gl.h>
#include <stdlib.h>

#include <cstdio>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>

#include "render/gl/egl_context.h"
#include "render/gl/framebuffer.h"
#include "render/gl/image_file.h"

namespace cloudreel::gl {
namespace {

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;

// One context, framebuffer and output folder for the whole program.
struct Setup {
  std::unique_ptr<EglContext> context;
  std::optional<Framebuffer> framebuffer;
  std::filesystem::path folder;
  std::string error;

  Setup() {
    Error failure;
    context = EglContext::createHeadless(&failure);
    if (!context || !context->makeCurrent(&failure) ||
        !(framebuffer = Framebuffer::create(kWidth, kHeight, &failure))) {
      error = failure.message;
      return;
    }
    std::string pattern = (std::filesystem::temp_directory_path() / "gl_frame_bench.XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr) {
      error = "no temporary folder";
      return;
    }
    folder = pattern;
    std::fprintf(stderr, "context: %s; depth %d bits\n", context->description().c_str(),
                 framebuffer->depthBits());
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

bool ready(benchmark::State& state) {
  if (!setup().error.empty()) {
    state.SkipWithError(setup().error.c_str());
    return false;
  }
  return true;
}

void clearFrame() {
  const FramebufferBinding binding(*setup().framebuffer);
  glClearColor(0.2f, 0.3f, 0.4f, 1.0f);
  glClear(GL_COLOR_BUFFER_BIT | GL_DEPTH_BUFFER_BIT);
}

void countFrames(benchmark::State& state) {
  state.counters["frames/s"] = benchmark::Counter(static_cast<double>(state.iterations()),
                                                  benchmark::Counter::kIsRate);
}

void BM_Clear(benchmark::State& state) {
  if (!ready(state)) {
    return;
  }
  for (auto _ : state) {
    clearFrame();
    glFinish();
  }
  countFrames(state);
}
BENCHMARK(BM_Clear)->Unit(benchmark::kMillisecond)->UseRealTime();

void BM_ReadColor(benchmark::State& state) {
  if (!ready(state)) {
    return;
  }
  clearFrame();
  RgbaImage image;
  for (auto _ : state) {
    if (!setup().framebuffer->readColor(image)) {
      state.SkipWithError("read-back failed");
      break;
    }
    benchmark::DoNotOptimize(image.pixels.data());
  }
  countFrames(state);
}
BENCHMARK(BM_ReadColor)->Unit(benchmark::kMillisecond)->UseRealTime();

void BM_ReadDepth(benchmark::State& state) {
  if (!ready(state)) {
    return;
  }
  clearFrame();
  DepthImage depth;
  for (auto _ : state) {
    if (!setup().framebuffer->readDepth(depth)) {
      state.SkipWithError("read-back failed");
      break;
    }
    benchmark::DoNotOptimize(depth.values.data());
  }
  countFrames(state);
}
BENCHMARK(BM_ReadDepth)->Unit(benchmark::kMillisecond)->UseRealTime();

void BM_WriteColorTiff(benchmark::State& state) {
  if (!ready(state)) {
    return;
  }
  clearFrame();
  RgbaImage image;
  if (!setup().framebuffer->readColor(image)) {
    state.SkipWithError("read-back failed");
    return;
  }
  const auto path = setup().folder / "colour.tif";
  for (auto _ : state) {
    if (!writeColorTiff(path, image)) {
      state.SkipWithError("write failed");
      break;
    }
  }
  countFrames(state);
}
BENCHMARK(BM_WriteColorTiff)->Unit(benchmark::kMillisecond)->UseRealTime();

void BM_WriteDepthTiff(benchmark::State& state) {
  if (!ready(state)) {
    return;
  }
  clearFrame();
  DepthImage depth;
  if (!setup().framebuffer->readDepth(depth)) {
    state.SkipWithError("read-back failed");
    return;
  }
  const auto path = setup().folder / "depth.tif";
  for (auto _ : state) {
    if (!writeDepthTiff(path, depth)) {
      state.SkipWithError("write failed");
      break;
    }
  }
  countFrames(state);
}
BENCHMARK(BM_WriteDepthTiff)->Unit(benchmark::kMillisecond)->UseRealTime();

// What an off-screen render pays per frame around its drawing.
void BM_WholeFrame(benchmark::State& state) {
  if (!ready(state)) {
    return;
  }
  RgbaImage image;
  DepthImage depth;
  const auto colourPath = setup().folder / "frame.tif";
  const auto depthPath = setup().folder / "frame-depth.tif";
  for (auto _ : state) {
    clearFrame();
    if (!setup().framebuffer->readColor(image) || !setup().framebuffer->readDepth(depth) ||
        !writeColorTiff(colourPath, image) || !writeDepthTiff(depthPath, depth)) {
      state.SkipWithError("frame failed");
      break;
    }
  }
  countFrames(state);
}
BENCHMARK(BM_WholeFrame)->Unit(benchmark::kMillisecond)->UseRealTime();

}  // namespace
}  // namespace cloudreel::gl

BENCHMARK_MAIN();
