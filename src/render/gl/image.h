#pragma once
// Frames in memory as the renderer produces them and the image files store
// them: the first row is the top row of the picture.

#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

namespace cloudreel::gl {

// Colour as 4 bytes a pixel in the order R, G, B, A.
struct RgbaImage {
  int width = 0;
  int height = 0;
  std::vector<std::uint8_t> pixels;

  std::size_t rowBytes() const { return static_cast<std::size_t>(width) * 4; }
  // Answers false if the pixel buffer does not match the dimensions.
  bool isConsistent() const {
    return width >= 0 && height >= 0 && pixels.size() == rowBytes() * static_cast<std::size_t>(height);
  }
};

// Depth as one unsigned 16-bit value a pixel: 0 is the near plane, 65535 the
// far plane.
struct DepthImage {
  int width = 0;
  int height = 0;
  std::vector<std::uint16_t> values;

  bool isConsistent() const {
    return width >= 0 && height >= 0 &&
           values.size() == static_cast<std::size_t>(width) * static_cast<std::size_t>(height);
  }
};

// Turns an image upside down in place: OpenGL hands rows over bottom first,
// files and RgbaImage keep the top row first. Row i is swapped with row
// h-1-i while i < h-1-i, so the middle row of an odd height stays where it
// is. A buffer shorter than rowBytes * height is a caller's bug: asserted,
// and left untouched in release builds.
void flipRows(std::span<std::uint8_t> pixels, std::size_t rowBytes, std::size_t height);
void flipRows(std::span<std::uint16_t> values, std::size_t rowValues, std::size_t height);

}  // namespace cloudreel::gl
