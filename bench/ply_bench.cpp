// Reading PLY point clouds the way the point-file import does: a vertex of
// x, y, z as float and red, green, blue as uchar, every value handed to a
// callback that stores it into a packed 16-byte record. Ten million vertices,
// in binary little-endian and in ASCII, reported as vertices per second.
// Then the same files imported as a PLYFile layer, with the import's peak
// memory over the array it ends with: binary files take the block decoding
// (also with double coordinates, and with normals), and the same binary
// file through the per-value callbacks is kept beside it for comparison.
// Last, the measuring pass `cloudreel info` makes of a binary file.
//
// CLOUDREEL_BENCH_DIR sets the folder for the files (default the temporary
// folder); they are written once per run and removed at its end.

#include <benchmark/benchmark.h>

#include <algorithm>
#include <charconv>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "bench_files.h"
#include "import/ply/ply.h"
#include "import/ply_file.h"
#include "peak_memory.h"

namespace cloudreel {
namespace {

constexpr long kVertices = 10'000'000;

struct Record {
  float x, y, z;
  std::uint8_t red, green, blue, spare;
};
static_assert(sizeof(Record) == 16);

// Points on a wavy sheet, coloured by position: deterministic, and with the
// spread of digits a scanned scene has.
Record vertex(long i) {
  float u = static_cast<float>(i % 4000) * 0.0025f - 5.0f;
  float v = static_cast<float>(i / 4000) * 0.0025f - 3.125f;
  float w = 0.25f * u * v + 0.001f * static_cast<float>(i % 7);
  return Record{u,
                v,
                w,
                static_cast<std::uint8_t>(i),
                static_cast<std::uint8_t>(i >> 8),
                static_cast<std::uint8_t>(i * 7),
                0};
}

// The vertex layouts of the files: the coordinates as float or double,
// normals (float) between them and the colour or none.
enum class Layout { Float, Double, FloatWithNormals };

std::string header(const char* format, Layout layout) {
  const std::string coordinate = layout == Layout::Double ? "double" : "float";
  std::string text = std::string("ply\nformat ") + format + " 1.0\nelement vertex " +
                     std::to_string(kVertices) + "\n";
  for (const char* axis : {"x", "y", "z"}) {
    text += "property " + coordinate + " " + axis + "\n";
  }
  if (layout == Layout::FloatWithNormals) {
    text += "property float nx\nproperty float ny\nproperty float nz\n";
  }
  return text + "property uchar red\nproperty uchar green\nproperty uchar blue\nend_header\n";
}

// Binary records are written with the machine's byte order: the benchmarks
// run on little-endian machines only.
void appendBinary(std::string& text, const Record& r, Layout layout) {
  auto put = [&text](auto value) {
    char bytes[sizeof value];
    std::memcpy(bytes, &value, sizeof value);
    text.append(bytes, sizeof value);
  };
  if (layout == Layout::Double) {
    put(double{r.x});
    put(double{r.y});
    put(double{r.z});
  } else {
    put(r.x);
    put(r.y);
    put(r.z);
  }
  if (layout == Layout::FloatWithNormals) {
    put(0.0f);
    put(0.0f);
    put(1.0f);
  }
  put(r.red);
  put(r.green);
  put(r.blue);
}

bool writeFile(const std::filesystem::path& path, bool ascii, Layout layout = Layout::Float) {
  bench::ChunkedTextFile file(path);
  if (!file.isOpen()) {
    return false;
  }
  std::string& text = file.text();
  text = header(ascii ? "ascii" : "binary_little_endian", layout);
  // Appends a number and the separator after it.
  auto put = [&text](auto value, char separator) {
    char digits[32];
    text.append(digits, std::to_chars(digits, digits + sizeof digits, value).ptr);
    text.push_back(separator);
  };
  for (long i = 0; i < kVertices; ++i) {
    Record r = vertex(i);
    if (ascii) {
      put(r.x, ' ');
      put(r.y, ' ');
      put(r.z, ' ');
      put(unsigned{r.red}, ' ');
      put(unsigned{r.green}, ' ');
      put(unsigned{r.blue}, '\n');
    } else {
      appendBinary(text, r, layout);
    }
    if (!file.flushIfFull()) {
      return false;
    }
  }
  return file.close();
}

// The two files, written on first use and removed when the program ends.
struct BenchFiles {
  BenchFiles() {
    const std::filesystem::path folder = bench::benchFolder();
    binary = folder / "cloudreel-bench-vertices-binary.ply";
    ascii = folder / "cloudreel-bench-vertices-ascii.ply";
    ok = writeFile(binary, false) && writeFile(ascii, true);
  }
  ~BenchFiles() {
    std::error_code ignored;
    std::filesystem::remove(binary, ignored);
    std::filesystem::remove(ascii, ignored);
  }
  std::filesystem::path binary, ascii;
  bool ok = false;
};

BenchFiles& benchFiles() {
  static BenchFiles files;
  return files;
}

// A binary file of another layout, written when its benchmark first runs
// and removed when the program ends; empty when it cannot be written.
struct LayoutFile {
  explicit LayoutFile(Layout layout) {
    path =
        bench::benchFolder() / (layout == Layout::Double ? "cloudreel-bench-vertices-double.ply"
                                                         : "cloudreel-bench-vertices-normals.ply");
    if (!writeFile(path, false, layout)) {
      path.clear();
    }
  }
  ~LayoutFile() {
    std::error_code ignored;
    std::filesystem::remove(path, ignored);
  }
  std::filesystem::path path;
};

const std::filesystem::path& layoutFile(Layout layout) {
  static LayoutFile doubles(Layout::Double);
  static LayoutFile normals(Layout::FloatWithNormals);
  return layout == Layout::Double ? doubles.path : normals.path;
}

struct Context {
  Record* points;
  std::int32_t index;
};

// The import's callback: slots 0-2 are x, y, z; 3-5 the colour bytes, and
// the blue byte completes a record.
int storeValue(p_ply_argument argument) {
  void* pdata = nullptr;
  long slot = 0;
  ply_get_argument_user_data(argument, &pdata, &slot);
  auto* context = static_cast<Context*>(pdata);
  double value = ply_get_argument_value(argument);
  Record& record = context->points[context->index];
  switch (slot) {
    case 0:
      record.x = static_cast<float>(value);
      break;
    case 1:
      record.y = static_cast<float>(value);
      break;
    case 2:
      record.z = static_cast<float>(value);
      break;
    case 3:
      record.red = static_cast<std::uint8_t>(static_cast<std::int64_t>(value));
      break;
    case 4:
      record.green = static_cast<std::uint8_t>(static_cast<std::int64_t>(value));
      break;
    case 5:
      record.blue = static_cast<std::uint8_t>(static_cast<std::int64_t>(value));
      ++context->index;
      break;
    default:
      break;
  }
  return 1;
}

void readVertices(benchmark::State& state, const std::filesystem::path& path) {
  if (!benchFiles().ok) {
    state.SkipWithError("cannot write the benchmark files");
    return;
  }
  std::vector<Record> points(static_cast<std::size_t>(kVertices));
  static const char* const kNames[] = {"x", "y", "z", "red", "green", "blue"};
  for (auto _ : state) {
    Context context{points.data(), 0};
    PlyHandle ply(ply_open(path.c_str(), nullptr, 0, nullptr));
    if (!ply || !ply_read_header(ply.get())) {
      state.SkipWithError("cannot read the header");
      return;
    }
    long count = 0;
    for (long slot = 0; slot < 6; ++slot) {
      long n = ply_set_read_cb(ply.get(), "vertex", kNames[slot], storeValue, &context, slot);
      count = slot == 0 ? n : count;
    }
    if (count != kVertices || !ply_read(ply.get()) || context.index != kVertices) {
      state.SkipWithError("reading failed");
      return;
    }
    benchmark::DoNotOptimize(points.data());
    benchmark::ClobberMemory();
  }
  Record last = vertex(kVertices - 1);
  if (std::memcmp(&points.back(), &last, sizeof last) != 0) {
    state.SkipWithError("the last vertex was read wrongly");
  }
  state.counters["vertices_per_second"] =
      benchmark::Counter(static_cast<double>(kVertices) * static_cast<double>(state.iterations()),
                         benchmark::Counter::kIsRate);
}

void BM_ReadBinaryLittleEndian(benchmark::State& state) {
  readVertices(state, benchFiles().binary);
}
BENCHMARK(BM_ReadBinaryLittleEndian)->Iterations(5)->UseRealTime()->Unit(benchmark::kMillisecond);

void BM_ReadAscii(benchmark::State& state) { readVertices(state, benchFiles().ascii); }
BENCHMARK(BM_ReadAscii)->Iterations(3)->UseRealTime()->Unit(benchmark::kMillisecond);

// One import, checked, with its peak memory: the resident high-water mark
// is reset to the current resident size first, and the figure is what the
// import adds to the resident size at its peak over the bytes of the array
// it leaves (0 when /proc/self/clear_refs cannot be written). Null, with the
// reason in `failure`, when the layer is not the file's.
std::shared_ptr<PLYFile> importChecked(const std::filesystem::path& path,
                                       PLYFile::VertexReading reading, double& peakOverArray,
                                       const char*& failure) {
  const bench::PeakMemory peak;
  auto layer = PLYFile::initWithURLDownsample(path, 1, reading);
  if (!layer || layer->nPoints() != kVertices) {
    failure = "the import failed";
    return nullptr;
  }
  peakOverArray = peak.over(static_cast<double>(layer->pointArray()->size()));
  const Record expected = vertex(kVertices - 1);
  if (std::memcmp(&layer->colorPoints().back(), &expected, 15) != 0) {
    failure = "the last vertex was read wrongly";
    return nullptr;
  }
  return layer;
}

// The first import of a process is timed on its own (first_import_ms): it
// is the one that takes the array's memory fresh from the system, which on
// a virtual machine can cost far more than in later imports. The rate is
// that of the imports after it.
void importLayer(benchmark::State& state, const std::filesystem::path& path,
                 PLYFile::VertexReading reading = PLYFile::VertexReading::Automatic) {
  if (!benchFiles().ok || path.empty()) {
    state.SkipWithError("cannot write the benchmark files");
    return;
  }
  double peak = 0.0;
  double worstPeak = 0.0;
  const char* failure = nullptr;
  const auto start = std::chrono::steady_clock::now();
  if (!importChecked(path, reading, peak, failure)) {
    state.SkipWithError(failure);
    return;
  }
  const std::chrono::duration<double, std::milli> first = std::chrono::steady_clock::now() - start;
  worstPeak = peak;
  for (auto _ : state) {
    auto layer = importChecked(path, reading, peak, failure);
    state.PauseTiming();
    if (!layer) {
      state.SkipWithError(failure);
      return;
    }
    worstPeak = std::max(worstPeak, peak);
    layer.reset();  // freed outside the timing
    state.ResumeTiming();
  }
  state.counters["vertices_per_second"] =
      benchmark::Counter(static_cast<double>(kVertices) * static_cast<double>(state.iterations()),
                         benchmark::Counter::kIsRate);
  state.counters["peak_over_array"] = worstPeak;
  state.counters["first_import_ms"] = first.count();
}

void BM_ImportLayerBinaryLittleEndian(benchmark::State& state) {
  importLayer(state, benchFiles().binary);
}
BENCHMARK(BM_ImportLayerBinaryLittleEndian)
    ->Iterations(5)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);

void BM_ImportLayerBinaryLittleEndianCallbacks(benchmark::State& state) {
  importLayer(state, benchFiles().binary, PLYFile::VertexReading::Callbacks);
}
BENCHMARK(BM_ImportLayerBinaryLittleEndianCallbacks)
    ->Iterations(5)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);

void BM_ImportLayerBinaryDouble(benchmark::State& state) {
  importLayer(state, layoutFile(Layout::Double));
}
BENCHMARK(BM_ImportLayerBinaryDouble)->Iterations(5)->UseRealTime()->Unit(benchmark::kMillisecond);

void BM_ImportLayerBinaryWithNormals(benchmark::State& state) {
  importLayer(state, layoutFile(Layout::FloatWithNormals));
}
BENCHMARK(BM_ImportLayerBinaryWithNormals)
    ->Iterations(5)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);

void BM_ImportLayerAscii(benchmark::State& state) { importLayer(state, benchFiles().ascii); }
BENCHMARK(BM_ImportLayerAscii)->Iterations(3)->UseRealTime()->Unit(benchmark::kMillisecond);

// The count and box of the binary file without an array, as `cloudreel
// info` takes them.
void BM_MeasureBinaryLittleEndian(benchmark::State& state) {
  if (!benchFiles().ok) {
    state.SkipWithError("cannot write the benchmark files");
    return;
  }
  for (auto _ : state) {
    const auto extent = PLYFile::measureURLDownsample(benchFiles().binary, 1);
    if (!extent || extent->nPoints != kVertices) {
      state.SkipWithError("measuring failed");
      return;
    }
    benchmark::DoNotOptimize(extent->bbox);
  }
  state.counters["vertices_per_second"] =
      benchmark::Counter(static_cast<double>(kVertices) * static_cast<double>(state.iterations()),
                         benchmark::Counter::kIsRate);
}
BENCHMARK(BM_MeasureBinaryLittleEndian)
    ->Iterations(5)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace cloudreel

BENCHMARK_MAIN();
