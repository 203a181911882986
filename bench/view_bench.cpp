// Frames per second of the interactive document view at 1920 × 1080, for
// documents of 1 and 10 million points, in the normal, anaglyph and
// orthographic view modes. Each mode is measured with the document's bucket
// settings as a new document has them (the override on at a fraction of
// 0.1: about a tenth of the points, what a user sees while flying) and with
// the override off (each layer's own limit of 1: every point). A frame is
// the view's drawFrame and a glFinish, into an off-screen framebuffer of the
// document's headless context; the label names the GL renderer.

#include <benchmark/benchmark.h>
#include <epoxy/gl.h>

#include <map>
#include <memory>
#include <optional>
#include <string>

#include "camera/scene_camera.h"
#include "platform/application_defaults.h"
#include "platform/log.h"
#include "random_cloud.h"
#include "render/gl/framebuffer.h"
#include "render/gl/gl_context.h"
#include "render/points_document_gl_view.h"
#include "scene/my_document.h"

namespace cloudreel {
namespace {

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;

// A document holding a cloud of n points in the cube [-1, 1]³, its scene
// camera 3 units away with a 45° field of view, so the cloud fills most of
// the frame as in render_bench; the orthographic view at its default zoom
// shows the cube's full height. The document's context stays current for
// the whole program, with the framebuffer bound for good.
struct Scene {
  MyDocument document;
  std::optional<gl::Framebuffer> framebuffer;
  RunLoop loop;
  PointsDocumentGLView view{loop};
  std::string renderer;
  std::string error;

  explicit Scene(std::int32_t n) {
    (void)useFactoryDefaultsInMemory();
    setLogSink([](std::string_view) {});
    const auto context = document.sharedGLContext();
    Error failure;
    if (!context || !context->makeCurrent(&failure) ||
        !(framebuffer = gl::Framebuffer::create(kWidth, kHeight, &failure))) {
      error = context ? failure.message : "no OpenGL context";
      return;
    }
    framebuffer->bind();
    if (const GLubyte* name = glGetString(GL_RENDERER)) {
      renderer = reinterpret_cast<const char*>(name);
    }

    document.addLayer(bench::randomCloud(n));
    const auto camera = document.sceneCamera();
    camera->setPositionZ(3.0);
    camera->setFieldOfView(45.0f);
    camera->setZNear(1.0f);
    camera->setZFar(10.0f);

    view.setDocument(&document);
    view.prepare();
    view.reshape(kWidth, kHeight);
  }
};

// Scenes are kept between benchmarks: making ten million points and
// uploading them takes longer than several frames.
Scene& sceneOf(std::int32_t n) {
  static std::map<std::int32_t, std::unique_ptr<Scene>> scenes;
  auto& scene = scenes[n];
  if (!scene) {
    scenes.clear();
    scene = std::make_unique<Scene>(n);
  }
  return *scene;
}

// Arguments: the number of points, and 1 to draw every point (0 keeps the
// new document's override of 0.1).
void BM_ViewFrame(benchmark::State& state, PointsDocumentGLView::ViewMode mode) {
  Scene& scene = sceneOf(static_cast<std::int32_t>(state.range(0)));
  if (!scene.error.empty()) {
    state.SkipWithError(scene.error.c_str());
    return;
  }
  // With the override off each layer's own bucket limit applies; the cloud's
  // is 1, which draws every point (their luck is at most 254).
  scene.document.setOverrideBuckets(state.range(1) == 0);
  scene.view.setViewMode(mode);
  // The first frame after a change of points drawn rebuilds the drawing
  // (the first one of all uploads the cloud): not the view's steady cost.
  scene.view.drawFrame();
  glFinish();
  for (auto _ : state) {
    scene.view.drawFrame();
    glFinish();
  }
  state.counters["frames/s"] = benchmark::Counter(1, benchmark::Counter::kIsIterationInvariantRate);
  state.SetLabel(scene.renderer);
}

// The 1 M cases first, then the 10 M ones, so each document is made once.
void oneMillion(benchmark::internal::Benchmark* b) {
  b->ArgNames({"points", "all"})
      ->Args({1'000'000, 0})
      ->Args({1'000'000, 1})
      ->Unit(benchmark::kMillisecond)
      ->UseRealTime()
      ->MinTime(2);
}

// A frame of every one of ten million points takes seconds on a software
// rasteriser.
void tenMillion(benchmark::internal::Benchmark* b) {
  b->ArgNames({"points", "all"})
      ->Args({10'000'000, 0})
      ->Args({10'000'000, 1})
      ->Unit(benchmark::kMillisecond)
      ->UseRealTime()
      ->Iterations(3);
}

BENCHMARK_CAPTURE(BM_ViewFrame, normal, PointsDocumentGLView::kNormal)->Apply(oneMillion);
BENCHMARK_CAPTURE(BM_ViewFrame, anaglyph, PointsDocumentGLView::kAnaglyph)->Apply(oneMillion);
BENCHMARK_CAPTURE(BM_ViewFrame, orthographic, PointsDocumentGLView::kOrthographic)
    ->Apply(oneMillion);
BENCHMARK_CAPTURE(BM_ViewFrame, normal, PointsDocumentGLView::kNormal)->Apply(tenMillion);
BENCHMARK_CAPTURE(BM_ViewFrame, anaglyph, PointsDocumentGLView::kAnaglyph)->Apply(tenMillion);
BENCHMARK_CAPTURE(BM_ViewFrame, orthographic, PointsDocumentGLView::kOrthographic)
    ->Apply(tenMillion);

}  // namespace
}  // namespace cloudreel

BENCHMARK_MAIN();
