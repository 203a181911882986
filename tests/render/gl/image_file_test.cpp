#include "render/gl/image_file.h"

#include <gtest/gtest.h>
#include <tiffio.h>

#include <tuple>
#include <vector>

#include "support/temp_dir.h"

namespace cloudreel::gl {
namespace {

// 3 × 2 pixels; each pixel's colour encodes its position so that a
// transposed or flipped read shows.
RgbaImage colourPattern() {
  RgbaImage image;
  image.width = 3;
  image.height = 2;
  for (int y = 0; y < 2; ++y) {
    for (int x = 0; x < 3; ++x) {
      const auto v = static_cast<std::uint8_t>(10 * (y * 3 + x));
      image.pixels.insert(image.pixels.end(), {v, static_cast<std::uint8_t>(v + 1),
                                               static_cast<std::uint8_t>(v + 2), 77});
    }
  }
  return image;
}

DepthImage depthPattern() { return DepthImage{2, 3, {0, 1, 256, 4660, 65534, 65535}}; }

// Width, height, samples per pixel, bits per sample, photometric and
// orientation.
auto layoutOf(const TiffImage& t) {
  return std::tuple(t.width, t.height, t.samplesPerPixel, t.bitsPerSample, t.photometric,
                    t.orientation);
}

// The colour pattern as 8-bit RGB, top row first.
void expectColourPattern(const TiffImage& tiff) {
  EXPECT_EQ(layoutOf(tiff), std::tuple(3, 2, 3, 8, PHOTOMETRIC_RGB, ORIENTATION_TOPLEFT));
  std::vector<std::uint16_t> samples;
  for (std::uint16_t v = 0; v < 60; v += 10) {
    samples.insert(samples.end(), {v, std::uint16_t(v + 1), std::uint16_t(v + 2)});
  }
  EXPECT_EQ(tiff.samples, samples);
}

// Depth frames are 16-bit grey, top row first.
TEST(ImageFile, FramesReplaceTheTargetInTheirFormatAndLeaveNoTemporaryFile) {
  const testing::TempDir dir;
  const auto colour = testing::writeFile(dir / "frame.0001.tif", "an older frame");
  const auto depth = dir / "depth.0001.tif";
  Error error;
  ASSERT_TRUE(writeColorTiff(colour, colourPattern(), &error)) << error.message;
  ASSERT_TRUE(writeDepthTiff(depth, depthPattern(), &error)) << error.message;
  auto readColour = readTiff(colour, &error);
  ASSERT_TRUE(readColour) << error.message;
  expectColourPattern(*readColour);
  auto readDepth = readTiff(depth, &error);
  ASSERT_TRUE(readDepth) << error.message;
  EXPECT_EQ(layoutOf(*readDepth),
            std::tuple(2, 3, 1, 16, PHOTOMETRIC_MINISBLACK, ORIENTATION_TOPLEFT));
  EXPECT_EQ(readDepth->samples, depthPattern().values);
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(dir.path()), {}), 2);
}

TEST(ImageFile, RefusesEmptyAndInconsistentImages) {
  RgbaImage wrongSize = colourPattern();
  wrongSize.pixels.pop_back();
  const RgbaImage colourCases[] = {RgbaImage{}, RgbaImage{0, 5, {}}, RgbaImage{4, 0, {}},
                                   RgbaImage{-1, -1, {}}, wrongSize};
  for (const RgbaImage& image : colourCases) {
    std::vector<std::uint8_t> bytes = {1, 2, 3};
    Error error;
    EXPECT_FALSE(encodeColorTiff(image, bytes, &error));
    EXPECT_EQ(error.domain, kImageErrorDomain);
    EXPECT_EQ(error.code, static_cast<int>(ImageErrorCode::InvalidImage));
    EXPECT_TRUE(bytes.empty());
  }
  const DepthImage depthCases[] = {DepthImage{}, DepthImage{2, 2, {1, 2, 3}}};
  for (const DepthImage& image : depthCases) {
    std::vector<std::uint8_t> bytes;
    Error error;
    EXPECT_FALSE(encodeDepthTiff(image, bytes, &error));
    EXPECT_EQ(error.code, static_cast<int>(ImageErrorCode::InvalidImage));
  }
}

TEST(ImageFile, AFailedWriteNamesTheFileAndLeavesTheTargetAlone) {
  const testing::TempDir dir;
  Error error;
  const auto missing = dir / "no-such-folder" / "frame.tif";
  EXPECT_FALSE(writeColorTiff(missing, colourPattern(), &error));
  EXPECT_EQ(error.code, static_cast<int>(ImageErrorCode::WriteFailed));
  EXPECT_NE(error.message.find(missing.string()), std::string::npos) << error.message;

  // An empty image must not clobber the frame already there.
  const auto existing = dir / "frame.tif";
  ASSERT_TRUE(writeColorTiff(existing, colourPattern(), &error)) << error.message;
  EXPECT_FALSE(writeColorTiff(existing, RgbaImage{}, &error));
  EXPECT_NE(error.message.find(existing.string()), std::string::npos) << error.message;
  auto still = readTiff(existing, &error);
  ASSERT_TRUE(still) << error.message;
  expectColourPattern(*still);
}

TEST(ImageFile, ReadingRejectsWhatIsNotAWholeTiffWithAReason) {
  std::vector<std::uint8_t> whole;
  ASSERT_TRUE(encodeColorTiff(colourPattern(), whole));
  const auto firstBytes = [&](std::size_t n) {
    return std::vector<std::uint8_t>(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(n));
  };
  // Truncated files must fail instead of reading past the end.
  const std::vector<std::uint8_t> inputs[] = {{},
                                              {'P', 'N', 'G'},
                                              {'I', 'I', 42, 0, 0xFF, 0xFF, 0xFF, 0x7F},
                                              firstBytes(8),
                                              firstBytes(20),
                                              firstBytes(whole.size() / 2)};
  for (const auto& bytes : inputs) {
    Error error;
    EXPECT_FALSE(decodeTiff(bytes, &error)) << bytes.size() << " bytes";
    EXPECT_EQ(error.domain, kImageErrorDomain);
    EXPECT_FALSE(error.message.empty());
  }
  const testing::TempDir dir;
  Error error;
  EXPECT_FALSE(readTiff(dir / "absent.tif", &error));
  EXPECT_NE(error.message.find("absent.tif"), std::string::npos) << error.message;
}

}  // namespace
}  // namespace cloudreel::gl
