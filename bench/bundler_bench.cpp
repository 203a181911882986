// Importing a bundle file as a BundlerFile layer: a reconstruction of one
// million points seen by 500 cameras, written the way reconstructions are
// (positions in scientific notation with ten decimals, a view list of two to
// five views per point), read from the page cache. Reported as points per
// second, with the import's peak memory over the point array it leaves.
// The points are read on every core; BM_ImportBundleFileOneThread reads
// them on one, for comparison.
//
// CLOUDREEL_BENCH_DIR sets the folder for the reconstruction (default the
// temporary folder); it is written once per run and removed at its end. It
// has no list.txt, so no photograph is read.

#include <benchmark/benchmark.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <chrono>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <numbers>
#include <string>
#include <string_view>

#include "bench_files.h"
#include "import/bundler_file.h"
#include "peak_memory.h"
#include "platform/application_defaults.h"
#include "platform/log.h"
#include "platform/user_defaults.h"

namespace cloudreel {
namespace {

constexpr std::int32_t kPoints = 1'000'000;
constexpr std::int32_t kCameras = 500;

struct Position {
  float x, y, z;
};

// Points on a wavy sheet. Eleven significant digits give a float back
// exactly, so the check can compare with these.
Position positionOf(std::int32_t i) {
  const double u = (i % 1000) * 0.01 - 5.0;
  const double v = (i / 1000) * 0.01 - 5.0;
  return {static_cast<float>(u), static_cast<float>(v),
          static_cast<float>(0.3 * std::sin(u) * std::cos(v))};
}

// Appends a number and the separator after it.
template <typename T>
void put(std::string& text, T value, char separator) {
  char digits[40];
  text.append(digits, std::to_chars(digits, digits + sizeof digits, value).ptr);
  text.push_back(separator);
}

void putScientific(std::string& text, double value, char separator) {
  char digits[40];
  text.append(
      digits,
      std::to_chars(digits, digits + sizeof digits, value, std::chars_format::scientific, 10).ptr);
  text.push_back(separator);
}

bool writeReconstruction(const std::filesystem::path& path) {
  bench::ChunkedTextFile file(path);
  if (!file.isOpen()) {
    return false;
  }
  std::string& text = file.text();
  text = "# Bundle file v0.3\n";
  put(text, kCameras, ' ');
  put(text, kPoints, '\n');
  // A ring of cameras 10 units from the origin, looking at it: R turns
  // about y, and t = −R·C.
  for (std::int32_t c = 0; c < kCameras; ++c) {
    const double a = 2 * std::numbers::pi * c / kCameras;
    const double s = std::sin(a), k = std::cos(a);
    const double centre[3] = {10 * s, 0.5, 10 * k};
    const double r[3][3] = {{k, 0, -s}, {0, 1, 0}, {s, 0, k}};
    putScientific(text, 1500.0 + c, ' ');
    putScientific(text, -0.02, ' ');
    putScientific(text, 0.001, '\n');
    for (const auto& row : r) {
      putScientific(text, row[0], ' ');
      putScientific(text, row[1], ' ');
      putScientific(text, row[2], '\n');
    }
    for (const auto& row : r) {
      const double t = -(row[0] * centre[0] + row[1] * centre[1] + row[2] * centre[2]);
      putScientific(text, t, &row == &r[2] ? '\n' : ' ');
    }
  }
  for (std::int32_t i = 0; i < kPoints; ++i) {
    const Position p = positionOf(i);
    putScientific(text, p.x, ' ');
    putScientific(text, p.y, ' ');
    putScientific(text, p.z, '\n');
    put(text, i % 256, ' ');
    put(text, (i >> 8) % 256, ' ');
    put(text, (i * 7) % 256, '\n');
    const int views = 2 + i % 4;
    put(text, views, ' ');
    for (int v = 0; v < views; ++v) {
      put(text, (i * 7 + v * 13) % kCameras, ' ');
      put(text, i % 5000 + v, ' ');
      put(text, ((i + v) % 2000 - 1000) * 0.25, ' ');
      put(text, ((i * 3 + v) % 1500 - 750) * 0.5, v + 1 == views ? '\n' : ' ');
    }
    if (!file.flushIfFull()) {
      return false;
    }
  }
  return file.close();
}

// The reconstruction (root/bundle/bundle.out), written on first use and
// removed when the program ends. Layers take their defaults from memory and
// log nowhere, so a line per freed layer does not get in the way.
struct BenchFile {
  BenchFile() {
    (void)useFactoryDefaultsInMemory();
    setLogSink([](std::string_view) {});

    root = bench::benchFolder() / ("cloudreel-bench-bundle-" + std::to_string(::getpid()));
    std::error_code ec;
    std::filesystem::create_directories(root / "bundle", ec);
    path = root / "bundle" / "bundle.out";
    ok = !ec && writeReconstruction(path);
    bytes = ok ? std::filesystem::file_size(path, ec) : 0;
  }
  ~BenchFile() {
    std::error_code ignored;
    std::filesystem::remove_all(root, ignored);
  }
  std::filesystem::path root, path;
  std::uintmax_t bytes = 0;
  bool ok = false;
};

BenchFile& benchFile() {
  static BenchFile file;
  return file;
}

// One import, checked, with its peak memory: the resident high-water mark
// is reset to the current resident size first, and the figure is what the
// import adds to the resident size at its peak over the bytes of the array
// it leaves (0 when /proc/self/clear_refs cannot be written). Null, with the
// reason in `failure`, when the layer is not the file's. With `oneThread`
// the layer is read as a blank one told to read on one thread (the import
// command's naming and linking, which it skips, cost next to nothing).
std::shared_ptr<BundlerFile> importChecked(const std::filesystem::path& path, bool oneThread,
                                           double& peakOverArray, const char*& failure) {
  const bench::PeakMemory peak;
  std::shared_ptr<BundlerFile> layer;
  if (oneThread) {
    layer = std::make_shared<BundlerFile>();
    layer->setPointReading({1});
    if (layer->loadPointsFromURLError(path, nullptr)) {
      layer.reset();
    }
  } else {
    layer = BundlerFile::initWithURLShouldLink(path, false);
  }
  if (!layer || layer->nPoints() != kPoints || layer->ncameras() != kCameras) {
    failure = "the import failed";
    return nullptr;
  }
  peakOverArray = peak.over(static_cast<double>(layer->pointArray()->size()));
  const color_point& last = layer->colorPoints().back();
  if (last.z != positionOf(kPoints - 1).z || last.r != (kPoints - 1) % 256) {
    failure = "the last point was read wrongly";
    return nullptr;
  }
  return layer;
}

// The first import of a process is timed on its own (first_import_ms), as it
// takes the array's memory fresh from the system; the rate is that of the
// imports after it.
void importBundleFile(benchmark::State& state, bool oneThread) {
  const BenchFile& file = benchFile();
  if (!file.ok) {
    state.SkipWithError("cannot write the reconstruction");
    return;
  }
  double peak = 0.0;
  const char* failure = nullptr;
  const auto start = std::chrono::steady_clock::now();
  if (!importChecked(file.path, oneThread, peak, failure)) {
    state.SkipWithError(failure);
    return;
  }
  const std::chrono::duration<double, std::milli> first = std::chrono::steady_clock::now() - start;
  double worstPeak = peak;
  for (auto _ : state) {
    auto layer = importChecked(file.path, oneThread, peak, failure);
    state.PauseTiming();
    if (!layer) {
      state.SkipWithError(failure);
      return;
    }
    worstPeak = std::max(worstPeak, peak);
    layer.reset();  // freed outside the timing
    state.ResumeTiming();
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(kPoints) * state.iterations());
  state.SetBytesProcessed(static_cast<std::int64_t>(file.bytes) * state.iterations());
  state.counters["peak_over_array"] = worstPeak;
  state.counters["first_import_ms"] = first.count();
}

void BM_ImportBundleFile(benchmark::State& state) { importBundleFile(state, false); }
void BM_ImportBundleFileOneThread(benchmark::State& state) { importBundleFile(state, true); }
BENCHMARK(BM_ImportBundleFile)->Iterations(5)->UseRealTime()->Unit(benchmark::kMillisecond);
BENCHMARK(BM_ImportBundleFileOneThread)
    ->Iterations(5)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace cloudreel

BENCHMARK_MAIN();
