// The ocean layer's per-frame work for grids of 128, 256 and 512 samples a
// side: the update (the fields by inverse FFTs, then the positions and
// normals written into the layer's records), the fields alone, and the
// rebuild of the spectrum (and plans) that a change of parameters costs.
// The goal is an update of a 256 x 256 grid in under 5 ms. Times are in
// milliseconds; items are surface samples.

#include <benchmark/benchmark.h>

#include <cstddef>
#include <vector>

#include "scene/ocean_spectrum.h"
#include "scene/point_layer.h"

namespace cloudreel {
namespace {

OceanParameters parametersOf(const benchmark::State& state) {
  OceanParameters p;
  p.gridSize = static_cast<int>(state.range(0));
  p.patchSize = 100.0f;
  p.windSpeed = 12.0f;
  p.windDirection = 20.0f;
  return p;
}

std::int64_t samples(const benchmark::State& state) { return state.range(0) * state.range(0); }

void BM_OceanUpdate(benchmark::State& state) {
  OceanSpectrum ocean(parametersOf(state));
  const auto count = static_cast<std::size_t>(samples(state));
  std::vector<color_point> records(count);
  std::vector<float> normals(3 * count);
  float time = 0.0f;
  for (auto _ : state) {
    time += 1.0f / 30.0f;  // one frame of a 30 fps animation
    benchmark::DoNotOptimize(ocean.writeSurface(time, 1.0f, records, normals));
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * samples(state));
}

void BM_OceanFields(benchmark::State& state) {
  OceanSpectrum ocean(parametersOf(state));
  float time = 0.0f;
  for (auto _ : state) {
    time += 1.0f / 30.0f;
    benchmark::DoNotOptimize(ocean.evaluate(time).height.data());
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * samples(state));
}

void BM_OceanSpectrumRebuild(benchmark::State& state) {
  const OceanParameters p = parametersOf(state);
  for (auto _ : state) {
    OceanSpectrum ocean(p);
    benchmark::DoNotOptimize(&ocean);
  }
  state.SetItemsProcessed(state.iterations() * samples(state));
}

BENCHMARK(BM_OceanUpdate)->Arg(128)->Arg(256)->Arg(512)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_OceanFields)->Arg(128)->Arg(256)->Arg(512)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_OceanSpectrumRebuild)->Arg(128)->Arg(256)->Arg(512)->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace cloudreel

BENCHMARK_MAIN();
