// The keyed archive on the path that matters for big documents: an object
// holding one large byte blob (a point cloud), archived to a file and read
// back, each measured against a plain write or read of the same number of
// bytes in the same run, with the peak memory of every phase. Also the
// many-small-objects case of a document's structure.
//
// CLOUDREEL_BENCH_BLOB_MIB sets the blob size (default 1024) and
// CLOUDREEL_BENCH_DIR the folder for the files (default the temporary folder).

#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <numeric>
#include <string>

#include "bench_files.h"
#include "platform/byte_stream.h"
#include "platform/class_registry.h"
#include "platform/color.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"

namespace cloudreel {
namespace {

using Clock = std::chrono::steady_clock;

// Holds its points the way a point layer does and reads them straight into
// storage of the right size.
class BlobHolder : public Object {
 public:
  std::string_view className() const override { return "BlobHolder"; }
  void encodeWithCoder(KeyedArchiver& coder) const override {
    coder.encodeInt32(1, "version");
    coder.encodeBytes(points, "points");
  }
  void initWithCoder(KeyedUnarchiver& coder) override {
    auto length = coder.bytesLengthForKey("points");
    if (!length) {
      return;
    }
    points = Bytes(*length);
    coder.decodeBytesForKeyInto("points", points);
  }
  Bytes points;
};

std::size_t blobSize() {
  const char* mib = std::getenv("CLOUDREEL_BENCH_BLOB_MIB");
  return (mib ? std::strtoull(mib, nullptr, 10) : 1024) << 20;
}

std::filesystem::path benchFile(const char* name) {
  return bench::benchFolder() / name;
}

// Peak resident memory is measured per phase: writing 5 to clear_refs resets
// the high-water mark to the current resident size.
void resetPeakMemory() { std::ofstream("/proc/self/clear_refs") << "5"; }

double peakMemoryMiB() {
  std::ifstream status("/proc/self/status");
  std::string line;
  while (std::getline(status, line)) {
    if (line.rfind("VmHWM:", 0) == 0) {
      return std::stod(line.substr(6)) / 1024.0;
    }
  }
  return 0.0;
}

double secondsSince(Clock::time_point start) {
  return std::chrono::duration<double>(Clock::now() - start).count();
}

bool plainWrite(const std::filesystem::path& path, const Bytes& data, bool sync) {
  int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
  std::size_t done = 0;
  while (fd >= 0 && done < data.size()) {
    ssize_t n = ::write(fd, data.data() + done, std::min<std::size_t>(data.size() - done, 1 << 30));
    if (n <= 0) {
      break;
    }
    done += static_cast<std::size_t>(n);
  }
  bool ok = fd >= 0 && done == data.size() && (!sync || ::fsync(fd) == 0);
  return ::close(fd) == 0 && ok;
}

Bytes plainRead(const std::filesystem::path& path) {
  int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  Bytes data(static_cast<std::size_t>(std::filesystem::file_size(path)));
  std::size_t done = 0;
  while (fd >= 0 && done < data.size()) {
    ssize_t n = ::pread(fd, data.data() + done, std::min<std::size_t>(data.size() - done, 1 << 30),
                        static_cast<off_t>(done));
    if (n <= 0) {
      break;
    }
    done += static_cast<std::size_t>(n);
  }
  ::close(fd);
  return data;
}

std::shared_ptr<BlobHolder> makeHolder() {
  ClassRegistry::shared().registerClass<BlobHolder>("BlobHolder");
  auto holder = std::make_shared<BlobHolder>();
  holder->points.resize(blobSize());
  std::iota(holder->points.begin(), holder->points.end(), std::uint8_t{0});
  return holder;
}

// One timed phase: the disk is settled first (no dirty pages left from an
// earlier phase to be written back during this one) and the peak resident
// memory is reset, so both figures belong to the phase alone.
struct Phase {
  double seconds = 0;
  double peakMiB = 0;
  int runs = 0;

  template <class Body>
  bool run(Body&& body) {
    ::sync();
    resetPeakMemory();
    auto start = Clock::now();
    if (!body()) {
      return false;
    }
    seconds += secondsSince(start);
    peakMiB = std::max(peakMiB, peakMemoryMiB());
    ++runs;
    return true;
  }
  double average() const { return runs > 0 ? seconds / runs : 0.0; }
};

// Runs the plain phase and the archive phase of one iteration, alternating
// which goes first so that neither is favoured by what the other leaves.
template <class Plain, class Archive>
bool runPair(benchmark::State& state, Phase& plain, Phase& archive, Plain&& plainBody,
             Archive&& archiveBody) {
  double before = archive.seconds;
  bool archiveFirst = plain.runs % 2 == 1;
  bool ok = archiveFirst ? archive.run(archiveBody) && plain.run(plainBody)
                         : plain.run(plainBody) && archive.run(archiveBody);
  if (!ok) {
    state.SkipWithError("a phase failed");
    return false;
  }
  state.SetIterationTime(archive.seconds - before);
  return true;
}

void reportPair(benchmark::State& state, const Phase& plain, const Phase& archive,
                const std::string& plainName, const std::string& archiveName) {
  state.counters["blob_MiB"] = static_cast<double>(blobSize() >> 20);
  state.counters[plainName + "_s"] = plain.average();
  state.counters[archiveName + "_s"] = archive.average();
  state.counters["ratio"] = archive.seconds / plain.seconds;
  state.counters["peak_" + plainName + "_MiB"] = plain.peakMiB;
  state.counters["peak_" + archiveName + "_MiB"] = archive.peakMiB;
}

// Archiving streams to a file (closed, not synced) against write(2) of the
// same bytes.
void BM_ArchiveBlob(benchmark::State& state) {
  auto holder = makeHolder();
  auto plainPath = benchFile("cloudreel-bench-plain.bin");
  auto archivePath = benchFile("cloudreel-bench-archive.reel");
  Phase plain, archive;
  for (auto _ : state) {
    std::filesystem::remove(plainPath);
    std::filesystem::remove(archivePath);
    if (!runPair(
            state, plain, archive, [&] { return plainWrite(plainPath, holder->points, false); },
            [&] {
              Error error;
              auto out = FileOutputStream::create(archivePath, &error);
              if (!out) {
                return false;
              }
              KeyedArchiver archiver(*out);
              archiver.encodeObject(holder, "root");
              return archiver.finish(&error) && out->close();
            })) {
      return;
    }
  }
  reportPair(state, plain, archive, "plain", "archive");
}
BENCHMARK(BM_ArchiveBlob)->Iterations(4)->UseManualTime()->Unit(benchmark::kMillisecond);

// The saving path a user takes, with its sync and rename, against write(2)
// plus fsync of the same bytes.
void BM_SaveBlobToFileAtomically(benchmark::State& state) {
  auto holder = makeHolder();
  auto plainPath = benchFile("cloudreel-bench-plain.bin");
  auto archivePath = benchFile("cloudreel-bench-archive.reel");
  Phase plain, save;
  for (auto _ : state) {
    std::filesystem::remove(plainPath);
    std::filesystem::remove(archivePath);
    if (!runPair(
            state, plain, save, [&] { return plainWrite(plainPath, holder->points, true); },
            [&] {
              Error error;
              return KeyedArchiver::archiveRootObjectToFile(holder, archivePath, &error);
            })) {
      return;
    }
  }
  reportPair(state, plain, save, "plain_fsync", "save");
}
BENCHMARK(BM_SaveBlobToFileAtomically)->Iterations(4)->UseManualTime()->Unit(benchmark::kMillisecond);

// Unarchiving from a file against pread(2) of the same bytes into a buffer
// of the same size. The blob that was archived is gone before either runs,
// so the peaks are those of the reading alone; both files are in the page
// cache.
void BM_UnarchiveBlob(benchmark::State& state) {
  auto plainPath = benchFile("cloudreel-bench-plain.bin");
  auto archivePath = benchFile("cloudreel-bench-archive.reel");
  {
    auto holder = makeHolder();
    Error error;
    if (!plainWrite(plainPath, holder->points, false) ||
        !KeyedArchiver::archiveRootObjectToFile(holder, archivePath, &error)) {
      state.SkipWithError("cannot write the files to read");
      return;
    }
  }
  Phase plain, unarchive;
  for (auto _ : state) {
    if (!runPair(
            state, plain, unarchive,
            [&] {
              Bytes data = plainRead(plainPath);
              benchmark::DoNotOptimize(data.data());
              return data.size() == blobSize();
            },
            [&] {
              Error error;
              auto holder = std::dynamic_pointer_cast<BlobHolder>(
                  KeyedUnarchiver::unarchiveObjectWithFile(archivePath, &error));
              return holder && holder->points.size() == blobSize();
            })) {
      return;
    }
  }
  reportPair(state, plain, unarchive, "plain", "unarchive");
  std::filesystem::remove(plainPath);
  std::filesystem::remove(archivePath);
}
BENCHMARK(BM_UnarchiveBlob)->Iterations(4)->UseManualTime()->Unit(benchmark::kMillisecond);

// A document's structure: many small objects, some reached twice.
std::vector<std::shared_ptr<Color>> manyColors(std::size_t count) {
  std::vector<std::shared_ptr<Color>> colors;
  for (std::size_t i = 0; i < count; ++i) {
    colors.push_back(i % 4 == 3 ? colors[i - 1]
                                : Color::colorWithRGBA(static_cast<float>(i) / 1000.0f, 0.5f, 0.25f));
  }
  return colors;
}

void BM_ArchiveManyObjects(benchmark::State& state) {
  auto colors = manyColors(static_cast<std::size_t>(state.range(0)));
  for (auto _ : state) {
    MemoryOutputStream out;
    KeyedArchiver archiver(out);
    archiver.encodeList(colors, "colors");
    benchmark::DoNotOptimize(archiver.finish(nullptr));
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(BM_ArchiveManyObjects)->Arg(100000);

void BM_UnarchiveManyObjects(benchmark::State& state) {
  MemoryOutputStream out;
  {
    KeyedArchiver archiver(out);
    archiver.encodeList(manyColors(static_cast<std::size_t>(state.range(0))), "colors");
    (void)archiver.finish(nullptr);
  }
  for (auto _ : state) {
    MemoryInputStream in(out.bytes());
    auto coder = KeyedUnarchiver::open(in, nullptr);
    auto colors = coder->decodeListOfClassForKey<Color>("colors");
    benchmark::DoNotOptimize(colors);
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(BM_UnarchiveManyObjects)->Arg(100000);

}  // namespace
}  // namespace cloudreel

BENCHMARK_MAIN();
