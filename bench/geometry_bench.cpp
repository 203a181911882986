// The transform hot paths: every layer and camera multiplies and builds
// rotations each frame, and camera paths slerp once per frame.

#include <benchmark/benchmark.h>

#include "geometry/affine_transform.h"
#include "geometry/rotations.h"

namespace cloudreel {
namespace {

void BM_MultiplyByMatrix(benchmark::State& state) {
  AffineTransform a;
  a.setEulerRotationType({10, 20, 30}, 11);
  AffineTransform b;
  b.setAxisAngleRotation({0.001, 0, 0, 1});
  for (auto _ : state) {
    a.multiplyByMatrix(b);
    benchmark::DoNotOptimize(a.mx());
  }
  state.SetItemsProcessed(state.iterations());
}
BENCHMARK(BM_MultiplyByMatrix);

void BM_EulerRotation(benchmark::State& state) {
  AffineTransform t;
  double angle = 0.0;
  for (auto _ : state) {
    t.setEulerRotationType({angle, 2 * angle, 3 * angle}, 11);
    angle += 0.01;
    benchmark::DoNotOptimize(t.mx());
  }
  state.SetItemsProcessed(state.iterations());
}
BENCHMARK(BM_EulerRotation);

void BM_Slerp(benchmark::State& state) {
  Quaternion a;
  Quaternion b;
  eulerToQuaternion(a, 0, 10, 20);
  eulerToQuaternion(b, 90, 45, -30);
  Quaternion out;
  double t = 0.0;
  for (auto _ : state) {
    slerpQuaternion(a, b, out, t);
    t = t > 1.0 ? 0.0 : t + 0.001;
    benchmark::DoNotOptimize(out);
  }
  state.SetItemsProcessed(state.iterations());
}
BENCHMARK(BM_Slerp);

}  // namespace
}  // namespace cloudreel

BENCHMARK_MAIN();
