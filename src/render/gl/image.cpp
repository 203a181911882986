#include "render/gl/image.h"

#include <algorithm>
#include <cassert>

namespace cloudreel::gl {
namespace {

template <typename T>
void flipRowsOf(std::span<T> data, std::size_t rowLength, std::size_t height) {
  assert(height == 0 || data.size() / height >= rowLength);
  if (height < 2 || rowLength == 0 || data.size() / height < rowLength) {
    return;
  }
  for (std::size_t i = 0, j = height - 1; i < j; ++i, --j) {
    std::swap_ranges(data.begin() + static_cast<std::ptrdiff_t>(i * rowLength),
                     data.begin() + static_cast<std::ptrdiff_t>((i + 1) * rowLength),
                     data.begin() + static_cast<std::ptrdiff_t>(j * rowLength));
  }
}

}  // namespace

void flipRows(std::span<std::uint8_t> pixels, std::size_t rowBytes, std::size_t height) {
  flipRowsOf(pixels, rowBytes, height);
}

void flipRows(std::span<std::uint16_t> values, std::size_t rowValues, std::size_t height) {
  flipRowsOf(values, rowValues, height);
}

}  // namespace cloudreel::gl
