// Feeds arbitrary bytes to the point-file loader: the bytes are written to a
// file, a fresh point layer loads it, and every byte of the records and every
// triangle index the layer then claims to hold is read. The loader must
// refuse or cut short what the file cannot back, without a crash, a leak,
// undefined behaviour or an allocation the file's size does not justify.

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>

#include "scene/point_layer.h"
#include "fuzz_setup.h"
#include "scratch_file.h"

namespace {

using namespace cloudreel;

fuzz::ScratchFile& pointFile() {
  static fuzz::ScratchFile file("point_file_fuzz.rwb");
  return file;
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  fuzz::useFactoryDefaultsAndSilentLog();
  (void)pointFile();
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  pointFile().write(data, size);
  auto layer = std::make_shared<PointLayer>();
  Error error;
  (void)layer->loadPointsFromURLError(pointFile().path(), &error);

  // What the layer claims must lie inside what it holds: ASan reports any
  // byte read past the array or the triangle list.
  std::uint64_t sum = 0;
  const std::uint8_t* points = layer->points();
  if (points != nullptr && layer->nPoints() > 0) {
    const std::size_t bytes = static_cast<std::size_t>(layer->nPoints()) * layer->recordSize();
    for (std::size_t i = 0; i < bytes; ++i) {
      sum += points[i];
    }
  }
  for (const color_point& point : layer->colorPoints()) {
    sum += point.luck;
  }
  const std::size_t indices = static_cast<std::size_t>(layer->nFaces()) * 3;
  if (indices > layer->triangles().size()) {
    std::fprintf(stderr, "point_file_fuzz: %d faces but %zu indices\n", layer->nFaces(),
                 layer->triangles().size());
    std::abort();
  }
  for (std::size_t i = 0; i < indices; ++i) {
    sum += layer->triangles()[i];
  }
  volatile std::uint64_t sink = sum;
  (void)sink;
  return 0;
}
