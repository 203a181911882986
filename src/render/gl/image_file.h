#pragma once
// TIFF files of rendered frames, through libtiff.
//
// A colour frame is RGB, 8 bits a sample, 3 samples a pixel; a depth frame
// is one 16-bit grey sample a pixel, min-is-black (0 is black). Both store
// the top row first, uncompressed. The encoders work in memory; the path
// functions write the bytes atomically: a temporary file beside the target,
// then a rename, so a reader never sees half a frame.
//
// The reader exists so tests (and tools) can check what was written.

#include <cstdint>
#include <filesystem>
#include <optional>
#include <span>
#include <string_view>
#include <vector>

#include "platform/error.h"
#include "render/gl/image.h"

namespace cloudreel::gl {

inline constexpr std::string_view kImageErrorDomain = "cloudreel.image";

enum class ImageErrorCode : int {
  // Empty or inconsistent dimensions, or too large for a TIFF file.
  InvalidImage = 1,
  WriteFailed = 2,
  ReadFailed = 3,
  // A valid TIFF this reader does not handle (tiled, planar, odd depths).
  Unsupported = 4,
};

[[nodiscard]] bool encodeColorTiff(const RgbaImage& image, std::vector<std::uint8_t>& out,
                                   Error* error = nullptr);
[[nodiscard]] bool encodeDepthTiff(const DepthImage& image, std::vector<std::uint8_t>& out,
                                   Error* error = nullptr);

[[nodiscard]] bool writeColorTiff(const std::filesystem::path& path, const RgbaImage& image,
                                  Error* error = nullptr);
[[nodiscard]] bool writeDepthTiff(const std::filesystem::path& path, const DepthImage& image,
                                  Error* error = nullptr);

// A decoded strip-organised TIFF with 8- or 16-bit samples, interleaved,
// first row at the top as stored.
struct TiffImage {
  int width = 0;
  int height = 0;
  int samplesPerPixel = 0;
  int bitsPerSample = 0;
  int photometric = 0;  // libtiff's PHOTOMETRIC_* value
  int orientation = 0;  // libtiff's ORIENTATION_* value (1: top row first)
  // Every sample widened to 16 bits, row by row.
  std::vector<std::uint16_t> samples;

  std::uint16_t sample(int x, int y, int s) const {
    return samples[(static_cast<std::size_t>(y) * static_cast<std::size_t>(width) +
                    static_cast<std::size_t>(x)) *
                       static_cast<std::size_t>(samplesPerPixel) +
                   static_cast<std::size_t>(s)];
  }
};

[[nodiscard]] std::optional<TiffImage> decodeTiff(std::span<const std::uint8_t> bytes,
                                                  Error* error = nullptr);
[[nodiscard]] std::optional<TiffImage> readTiff(const std::filesystem::path& path,
                                                Error* error = nullptr);

}  // namespace cloudreel::gl
