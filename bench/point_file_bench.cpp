// Loading a point file (".rwb") of ten million points against a plain read
// of the same file, both from the page cache: the loader should cost little
// more than moving the bytes. The plain read goes into a buffer reused across
// iterations (the bare cost of the copy) or into memory allocated afresh every
// iteration (what any loader pays for new storage: the pages are first
// touched by the read), each either ordinary heap memory or a point array as
// a layer allocates it. The loader reads into a fresh layer each time. All
// report bytes per second of the whole file.
//
// CLOUDREEL_BENCH_DIR sets the folder for the file (default the temporary
// folder); it is written once per run and removed at its end.

#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>
#include <string>

#include "bench_files.h"
#include "platform/application_defaults.h"
#include "platform/error.h"
#include "platform/log.h"
#include "platform/user_defaults.h"
#include "scene/point_layer.h"

namespace cloudreel {
namespace {

constexpr std::int32_t kPoints = 10'000'000;
// The plain read's transfer size: large enough that system calls are noise.
constexpr std::size_t kBlock = std::size_t{8} << 20;

// Points on a wavy sheet, coloured by position, luck spread over 0-254.
color_point pointAt(std::int32_t i) {
  const float u = static_cast<float>(i % 4000) * 0.0025f - 5.0f;
  const float v = static_cast<float>(i / 4000) * 0.0025f - 3.125f;
  return color_point{u,
                     v,
                     0.25f * u * v,
                     static_cast<std::uint8_t>(i),
                     static_cast<std::uint8_t>(i >> 8),
                     static_cast<std::uint8_t>(i * 7),
                     static_cast<std::uint8_t>(i % 255)};
}

// Reads the whole file into `buffer` (at least `size` bytes) with read(2).
bool plainRead(const std::filesystem::path& path, char* buffer, std::size_t size) {
  const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) {
    return false;
  }
  std::size_t done = 0;
  while (done < size) {
    const ssize_t got = ::read(fd, buffer + done, std::min(kBlock, size - done));
    if (got <= 0) {
      break;
    }
    done += static_cast<std::size_t>(got);
  }
  ::close(fd);
  return done == size;
}

// The file, written on first use and removed when the program ends. The
// layers the benchmark makes take their defaults from memory and log
// nowhere, so neither the user's settings nor a line per freed layer gets
// in the way.
struct BenchFile {
  BenchFile() {
    (void)useFactoryDefaultsInMemory();
    setLogSink([](std::string_view) {});

    path = bench::benchFolder() / "cloudreel-bench-points.rwb";
    PointLayer layer;
    if (layer.allocatePointArrayWithSize(kPoints) == nullptr) {
      return;
    }
    layer.setNPoints(kPoints);
    std::int32_t i = 0;
    for (color_point& point : layer.colorPoints()) {
      point = pointAt(i++);
    }
    layer.setBoundingBoxWithMinXMaxXMinYMaxYMinZMaxZ(-5, 5, -3.125f, 3.125f, -5, 5);
    Error error;
    // NO means saved.
    if (layer.savePointsToURLError(path, &error)) {
      return;
    }
    size = std::filesystem::file_size(path);
    // Into the page cache before anything is timed.
    auto buffer = std::make_unique_for_overwrite<char[]>(size);
    ok = plainRead(path, buffer.get(), size);
  }
  ~BenchFile() {
    std::error_code ignored;
    std::filesystem::remove(path, ignored);
  }
  std::filesystem::path path;
  std::size_t size = 0;
  bool ok = false;
};

BenchFile& benchFile() {
  static BenchFile file;
  return file;
}

// The plain read's destination: ordinary heap memory, or a point array as a
// loading layer gets it (mapped in huge pages where the system offers them).
class Storage {
 public:
  Storage(bool pointArray, std::size_t size) {
    if (pointArray) {
      array_ = PointArray::allocate(size);
      data_ = array_ ? reinterpret_cast<char*>(array_->data()) : nullptr;
    } else {
      heap_ = std::make_unique_for_overwrite<char[]>(size);
      data_ = heap_.get();
    }
  }
  char* data() const { return data_; }

 private:
  std::unique_ptr<char[]> heap_;
  std::shared_ptr<PointArray> array_;
  char* data_ = nullptr;
};

// `fresh`: new storage every iteration, first touched by the read itself;
// otherwise one storage, every page mapped before the first timing.
void BM_PlainRead(benchmark::State& state, bool pointArray, bool fresh) {
  const BenchFile& file = benchFile();
  if (!file.ok) {
    state.SkipWithError("cannot write the point file");
    return;
  }
  std::unique_ptr<Storage> reused;
  if (!fresh) {
    reused = std::make_unique<Storage>(pointArray, file.size);
    std::memset(reused->data(), 0, file.size);
  }
  for (auto _ : state) {
    std::unique_ptr<Storage> storage =
        fresh ? std::make_unique<Storage>(pointArray, file.size) : nullptr;
    char* data = fresh ? storage->data() : reused->data();
    if (!plainRead(file.path, data, file.size)) {
      state.SkipWithError("reading failed");
      return;
    }
    benchmark::DoNotOptimize(data);
    benchmark::ClobberMemory();
  }
  state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(file.size));
}
BENCHMARK_CAPTURE(BM_PlainRead, reused_heap_buffer, false, false)
    ->Iterations(20)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_PlainRead, fresh_heap_buffer, false, true)
    ->Iterations(20)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_PlainRead, reused_point_array, true, false)
    ->Iterations(20)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_PlainRead, fresh_point_array, true, true)
    ->Iterations(20)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);

void BM_LoadPointsFromURL(benchmark::State& state) {
  const BenchFile& file = benchFile();
  if (!file.ok) {
    state.SkipWithError("cannot write the point file");
    return;
  }
  color_point last{};
  for (auto _ : state) {
    PointLayer layer;
    Error error;
    layer.loadPointsFromURLError(file.path, &error);
    if (!error.message.empty() || layer.nPoints() != kPoints) {
      state.SkipWithError("loading failed");
      return;
    }
    last = layer.colorPoints().back();
    benchmark::DoNotOptimize(layer.points());
    benchmark::ClobberMemory();
  }
  const color_point expected = pointAt(kPoints - 1);
  if (std::memcmp(&last, &expected, sizeof last) != 0) {
    state.SkipWithError("the last point was read wrongly");
  }
  state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(file.size));
}
BENCHMARK(BM_LoadPointsFromURL)->Iterations(20)->UseRealTime()->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace cloudreel

BENCHMARK_MAIN();
