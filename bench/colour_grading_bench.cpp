// Colour grading of one and ten million points: a preview with saturation
// (three table lookups and the luma mix a point), one at saturation 1 (one
// byte table), a session's start (the copy of the colours), and a preview
// followed by a cancel. Each reports points per second; the session's start
// also its peak memory over the records' size, which should stay near 3/16
// (one copy of the colours, not of the records). Grading runs on every
// core, so the times and rates are wall-clock times.

#include <benchmark/benchmark.h>

#include <cstdint>
#include <memory>

#include "peak_memory.h"
#include "random_cloud.h"
#include "scene/colour_grading.h"
#include "scene/point_layer.h"

namespace cloudreel {
namespace {

std::shared_ptr<PointLayer> cloudOf(const benchmark::State& state) {
  // Made once per size: filling ten million points costs more than grading.
  static std::shared_ptr<PointLayer> cached;
  const auto n = static_cast<std::int32_t>(state.range(0));
  if (!cached || cached->nPoints() != n) {
    cached.reset();
    cached = bench::randomCloud(n);
  }
  return cached;
}

void BM_PreviewWithSaturation(benchmark::State& state) {
  const auto layer = cloudOf(state);
  ColourGradingSession session(layer);
  float brightness = 0.0f;
  for (auto _ : state) {
    brightness = brightness > 0.2f ? -0.2f : brightness + 0.01f;
    session.preview({brightness, 1.2f, 0.7f, 1.4f});
    benchmark::DoNotOptimize(layer->points());
  }
  session.cancel();
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

void BM_PreviewWithoutSaturation(benchmark::State& state) {
  const auto layer = cloudOf(state);
  ColourGradingSession session(layer);
  float brightness = 0.0f;
  for (auto _ : state) {
    brightness = brightness > 0.2f ? -0.2f : brightness + 0.01f;
    session.preview({brightness, 1.2f, 1.0f, 1.4f});
    benchmark::DoNotOptimize(layer->points());
  }
  session.cancel();
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

void BM_StartSession(benchmark::State& state) {
  const auto layer = cloudOf(state);
  double memory = 0.0;
  for (auto _ : state) {
    bench::PeakMemory peak;
    ColourGradingSession session(layer);
    benchmark::DoNotOptimize(&session);
    state.PauseTiming();
    memory = peak.over(static_cast<double>(layer->nPoints()) * 16.0);
    state.ResumeTiming();
  }
  state.counters["peak_over_records"] = memory;
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

void BM_PreviewThenCancel(benchmark::State& state) {
  const auto layer = cloudOf(state);
  for (auto _ : state) {
    ColourGradingSession session(layer);
    session.preview({0.1f, 1.1f, 1.3f, 0.9f});
    session.cancel();
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

BENCHMARK(BM_PreviewWithSaturation)
    ->Arg(1'000'000)
    ->Arg(10'000'000)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();
BENCHMARK(BM_PreviewWithoutSaturation)
    ->Arg(1'000'000)
    ->Arg(10'000'000)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();
BENCHMARK(BM_StartSession)
    ->Arg(1'000'000)
    ->Arg(10'000'000)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();
BENCHMARK(BM_PreviewThenCancel)
    ->Arg(1'000'000)
    ->Arg(10'000'000)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();

}  // namespace
}  // namespace cloudreel

BENCHMARK_MAIN();
