// Saving and opening a document that holds a ten-million-point layer, inline
// (the records travel in the document) and linked (the document names a
// point file, which the save writes back and the open reads). Each is
// measured against a plain write or read of the same bytes in the same run:
// the document should cost little more than moving its bytes. Saves are
// flushed to the disk, as the plain write is. Peak memory is reported over
// the point array ("peak_over_points"), which the document must not copy.
//
// CLOUDREEL_BENCH_DIR sets the folder for the files (default the temporary
// folder); they are removed at the end.

#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <unistd.h>

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "bench_files.h"
#include "peak_memory.h"
#include "platform/application_defaults.h"
#include "platform/class_registry.h"
#include "platform/log.h"
#include "scene/core_classes.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"

namespace cloudreel {
namespace {

constexpr std::int32_t kPoints = 10'000'000;
constexpr double kPointBytes = 16.0 * kPoints;

struct Files {
  Files() {
    (void)useFactoryDefaultsInMemory();
    setLogSink([](std::string_view) {});
    registerCoreClasses(ClassRegistry::shared());
    folder = bench::benchFolder();
  }
  ~Files() {
    std::error_code ignored;
    for (const char* name : {"bench-inline.reel", "bench-linked.reel", "bench-linked.rwb",
                             "bench-plain.bin"}) {
      std::filesystem::remove(folder / name, ignored);
    }
  }
  std::filesystem::path operator/(const char* name) const { return folder / name; }
  std::filesystem::path folder;
};

Files& files() {
  static Files f;
  return f;
}

std::shared_ptr<PointLayer> cloud() {
  auto layer = std::make_shared<PointLayer>();
  auto* records = reinterpret_cast<color_point*>(layer->allocatePointArrayWithSize(kPoints));
  for (std::int32_t i = 0; i < kPoints; ++i) {
    const float u = static_cast<float>(i % 4000) * 0.0025f;
    records[i] = {u, static_cast<float>(i / 4000) * 0.0025f, 0.25f * u,
                  static_cast<std::uint8_t>(i), 7, 9, static_cast<std::uint8_t>(i % 255)};
  }
  layer->setNPoints(kPoints);
  return layer;
}

// A document of the cloud, saved once: inline, or linked to its point file.
std::unique_ptr<MyDocument> documentOf(bool linked) {
  auto document = std::make_unique<MyDocument>();
  if (linked) {
    Error error;
    (void)cloud()->savePointsToURLError(files() / "bench-linked.rwb", &error);
    document->addLayer(PointLayer::initWithURLShouldLink(files() / "bench-linked.rwb", true));
  } else {
    document->addLayer(cloud());
  }
  return document;
}

void plainWrite(const std::filesystem::path& path, const std::vector<char>& bytes) {
  const int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
  std::size_t done = 0;
  while (fd >= 0 && done < bytes.size()) {
    const ssize_t n = ::write(fd, bytes.data() + done, bytes.size() - done);
    if (n <= 0) break;
    done += static_cast<std::size_t>(n);
  }
  if (fd >= 0) {
    (void)::fsync(fd);
    ::close(fd);
  }
}

void plainRead(const std::filesystem::path& path, std::vector<char>& bytes) {
  const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  std::size_t done = 0;
  while (fd >= 0 && done < bytes.size()) {
    const ssize_t n = ::read(fd, bytes.data() + done, bytes.size() - done);
    if (n <= 0) break;
    done += static_cast<std::size_t>(n);
  }
  if (fd >= 0) ::close(fd);
}

void BM_SaveDocument(benchmark::State& state) {
  const bool linked = state.range(0) != 0;
  const auto document = documentOf(linked);
  const auto path = files() / (linked ? "bench-linked.reel" : "bench-inline.reel");
  const bench::PeakMemory peak;
  for (auto _ : state) {
    if (linked) {
      // The save writes a modified linked cloud back to its point file.
      std::static_pointer_cast<PointLayer>(document->layers()[0])->setIsModified(true);
    }
    Error error;
    if (!document->writeToURLError(path, &error)) {
      state.SkipWithError(error.message.c_str());
      return;
    }
  }
  state.counters["peak_over_points"] = peak.over(kPointBytes);
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * kPointBytes));
}
BENCHMARK(BM_SaveDocument)->ArgName("linked")->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond);

void BM_OpenDocument(benchmark::State& state) {
  const bool linked = state.range(0) != 0;
  const auto path = files() / (linked ? "bench-linked.reel" : "bench-inline.reel");
  {
    Error error;
    (void)documentOf(linked)->writeToURLError(path, &error);
  }
  const bench::PeakMemory peak;
  for (auto _ : state) {
    MyDocument document;
    Error error;
    if (!document.readFromURLError(path, &error)) {
      state.SkipWithError(error.message.c_str());
      return;
    }
    benchmark::DoNotOptimize(document.layers().data());
  }
  state.counters["peak_over_points"] = peak.over(kPointBytes);
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * kPointBytes));
}
BENCHMARK(BM_OpenDocument)->ArgName("linked")->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond);

// The baselines: the same number of bytes written (flushed) and read plainly.
void BM_PlainWrite(benchmark::State& state) {
  std::vector<char> bytes(static_cast<std::size_t>(kPointBytes), 1);
  for (auto _ : state) {
    plainWrite(files() / "bench-plain.bin", bytes);
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * kPointBytes));
}
BENCHMARK(BM_PlainWrite)->Unit(benchmark::kMillisecond);

void BM_PlainRead(benchmark::State& state) {
  std::vector<char> bytes(static_cast<std::size_t>(kPointBytes), 1);
  plainWrite(files() / "bench-plain.bin", bytes);
  for (auto _ : state) {
    // Fresh memory each time, as an opened document's array is.
    std::vector<char> into(bytes.size());
    plainRead(files() / "bench-plain.bin", into);
    benchmark::DoNotOptimize(into.data());
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * kPointBytes));
}
BENCHMARK(BM_PlainRead)->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace cloudreel

BENCHMARK_MAIN();
