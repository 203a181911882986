#include "scene/image_sequence.h"

#include <gtest/gtest.h>
#include <stb/stb_image_write.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <set>
#include <string>
#include <tuple>
#include <vector>

#include "render/gl/image_file.h"
#include "scene/image_sequence_decoder.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

namespace fs = std::filesystem;
using testing::TempDir;
using testing::writeFile;
using Rgba = std::array<std::uint8_t, 4>;

// `size` × `size` pixels of one colour, RGBA.
std::vector<std::uint8_t> solidPixels(int size, Rgba colour) {
  std::vector<std::uint8_t> pixels(static_cast<std::size_t>(size) * static_cast<std::size_t>(size) *
                                   4);
  for (std::size_t at = 0; at < pixels.size(); at += 4) {
    std::memcpy(pixels.data() + at, colour.data(), 4);
  }
  return pixels;
}

fs::path writeSolidPng(const fs::path& path, int size, Rgba colour) {
  const std::vector<std::uint8_t> pixels = solidPixels(size, colour);
  EXPECT_NE(stbi_write_png(path.c_str(), size, size, 4, pixels.data(), size * 4), 0);
  return path;
}

// A different colour for each of the first 50 frames (the bytes wrap after).
Rgba colourOf(int frame) {
  return {static_cast<std::uint8_t>(frame * 5), static_cast<std::uint8_t>(255 - frame * 4),
          static_cast<std::uint8_t>((frame * 53) % 256), 255};
}

Rgba pixelAt(const DecodedImage& image, int x, int y) {
  const std::size_t at = (static_cast<std::size_t>(y) * static_cast<std::size_t>(image.width) +
                          static_cast<std::size_t>(x)) *
                         4;
  return {image.pixels[at], image.pixels[at + 1], image.pixels[at + 2], image.pixels[at + 3]};
}

bool isSolid(const DecodedImage& image, Rgba colour) {
  for (int y = 0; y < image.height; ++y) {
    for (int x = 0; x < image.width; ++x) {
      if (pixelAt(image, x, y) != colour) {
        return false;
      }
    }
  }
  return true;
}

std::vector<std::string> frameNames(const ImageSequence& sequence) {
  std::vector<std::string> names;
  for (int i = 0; i < sequence.frameCount(); ++i) {
    names.push_back(sequence.fileForFrame(i).filename().string());
  }
  return names;
}

TEST(ImageSequence, AFolderGivesItsPicturesInNumberOrder) {
  TempDir dir;
  for (const char* name : {"frame_10.png", "frame_2.png", "frame_1.PNG", "frame_3.JpG", "notes.txt",
                           ".frame_0.png", "frame_4.png.bak"}) {
    writeFile(dir / name, "x");
  }
  fs::create_directory(dir / "frame_5.png");
  const auto sequence = ImageSequence::resolve(dir.path().string(), nullptr);
  ASSERT_TRUE(sequence);
  EXPECT_EQ(frameNames(*sequence), (std::vector<std::string>{"frame_1.PNG", "frame_2.png",
                                                             "frame_3.JpG", "frame_10.png"}));
  // Before the first frame the card holds its first picture, after the last
  // its last.
  EXPECT_EQ(sequence->fileForFrame(-7).filename(), "frame_1.PNG");
  EXPECT_EQ(sequence->fileForFrame(1 << 30).filename(), "frame_10.png");

  EXPECT_TRUE(naturalLess("a2b", "a10b"));
  EXPECT_TRUE(naturalLess("a9", "b1"));
  EXPECT_TRUE(naturalLess("x_1_9", "x_1_10"));
  EXPECT_TRUE(naturalLess("a", "a1"));
  EXPECT_FALSE(naturalLess("a10", "a10"));
  EXPECT_NE(naturalLess("a007", "a7"), naturalLess("a7", "a007"));

  writeFile(dir / "single.tiff", "x");
  const auto single = ImageSequence::resolve((dir / "single.tiff").string(), nullptr);
  ASSERT_TRUE(single);
  EXPECT_EQ(single->frameCount(), 1);
  EXPECT_EQ(single->fileForFrame(3), dir / "single.tiff");
}

TEST(ImageSequence, APatternRunsFromItsSmallestToItsLargestNumberGapsIncluded) {
  TempDir dir;
  for (const char* name : {"shot_0003.png", "shot_0005.png", "shot_0008.png", "shot_12.png",
                           "shot_00002.png", "shot_0001.jpg", "take_0000.png", "f1.png", "f12.png",
                           "f007.png", "s  7.png", "s 10.png", "100%_01.png", "100%_03.png"}) {
    writeFile(dir / name, "x");
  }
  const auto shots = ImageSequence::resolve((dir / "shot_%04d.png").string(), nullptr);
  ASSERT_TRUE(shots);
  EXPECT_EQ(shots->frameCount(), 6);
  EXPECT_EQ(shots->firstNumber(), 3);
  // A number without its file keeps its place and names the missing file.
  EXPECT_EQ(shots->fileForFrame(1), dir / "shot_0004.png");
  EXPECT_FALSE(fs::exists(shots->fileForFrame(1)));
  EXPECT_EQ(shots->fileForFrame(2), dir / "shot_0005.png");
  EXPECT_EQ(shots->fileForFrame(-1), dir / "shot_0003.png");
  EXPECT_EQ(shots->fileForFrame(99), dir / "shot_0008.png");

  struct Case {
    const char* pattern;
    int first;
    int count;
    const char* second;
  };
  for (const Case& c : {Case{"f%d.png", 1, 12, "f2.png"}, Case{"s%3d.png", 7, 4, "s  8.png"},
                        Case{"100%%_%02d.png", 1, 3, "100%_02.png"},
                        Case{"take_%04i.png", 0, 1, "take_0000.png"}}) {
    const auto sequence = ImageSequence::resolve((dir / c.pattern).string(), nullptr);
    ASSERT_TRUE(sequence) << c.pattern;
    EXPECT_EQ(sequence->firstNumber(), c.first) << c.pattern;
    EXPECT_EQ(sequence->frameCount(), c.count) << c.pattern;
    EXPECT_EQ(sequence->fileForFrame(1).filename(), c.second) << c.pattern;
  }

  for (const char* pattern : {"a_%04d.png", "a_%d", "%%%5u%%", "/x/%d/a.png"}) {
    EXPECT_TRUE(ImageSequence::isPattern(pattern)) << pattern;
  }
  for (const char* pattern : {"a.png", "a_%d_%d.png", "a_%%.png", "a_%s.png", "a_%5.png",
                              "a_%-4d.png", "a_%d%", "%999d"}) {
    EXPECT_FALSE(ImageSequence::isPattern(pattern)) << pattern;
  }
}

TEST(ImageSequence, ASourceThatGivesNoFrameIsRefusedNamingIt) {
  TempDir dir;
  fs::create_directory(dir / "empty");
  writeFile(dir / "text/readme.txt", "x");
  writeFile(dir / "wide/w_0.png", "x");
  writeFile(dir / "wide/w_1000000.png", "x");
  writeFile(dir / "full/w_0.png", "x");
  writeFile(dir / "full/w_999999.png", "x");
  writeFile(dir / "d1/a.png", "x");

  struct Case {
    fs::path source;
    ImageSequenceErrorCode code;
  };
  for (const Case& c : {Case{dir / "missing.png", ImageSequenceErrorCode::NoFrames},
                        Case{dir / "empty", ImageSequenceErrorCode::NoFrames},
                        Case{dir / "text", ImageSequenceErrorCode::NoFrames},
                        Case{dir / "shot_%04d.png", ImageSequenceErrorCode::NoFrames},
                        Case{dir / "nowhere/shot_%04d.png", ImageSequenceErrorCode::NoFrames},
                        Case{dir / "shot_%s.png", ImageSequenceErrorCode::BadPattern},
                        Case{dir / "shot_%d_%d.png", ImageSequenceErrorCode::BadPattern},
                        Case{dir / "d%d/a.png", ImageSequenceErrorCode::BadPattern},
                        Case{dir / "wide/w_%d.png", ImageSequenceErrorCode::TooManyFrames}}) {
    Error error;
    EXPECT_FALSE(ImageSequence::resolve(c.source.string(), &error)) << c.source;
    EXPECT_EQ(error.domain, kImageSequenceErrorDomain) << c.source;
    EXPECT_EQ(error.code, static_cast<int>(c.code)) << c.source;
    EXPECT_NE(error.message.find(c.source.string()), std::string::npos) << error.message;
  }
  Error error;
  EXPECT_FALSE(ImageSequence::resolve("", &error));
  EXPECT_FALSE(error.message.empty());
  // A million numbers is the most a pattern may span.
  const auto full = ImageSequence::resolve((dir / "full/w_%d.png").string(), nullptr);
  ASSERT_TRUE(full);
  EXPECT_EQ(full->frameCount(), 1'000'000);
}

TEST(ImageFile, PngJpegAndTiffDecodeToRgbaOfTheirSize) {
  TempDir dir;
  std::vector<std::uint8_t> rgba;
  for (int i = 0; i < 5 * 3; ++i) {
    rgba.insert(rgba.end(), {static_cast<std::uint8_t>(i * 17), static_cast<std::uint8_t>(i),
                             static_cast<std::uint8_t>(255 - i), static_cast<std::uint8_t>(i * 9)});
  }
  ASSERT_NE(stbi_write_png((dir / "a.png").c_str(), 5, 3, 4, rgba.data(), 20), 0);
  const std::array<std::uint8_t, 4> grey{0, 80, 160, 255};
  ASSERT_NE(stbi_write_png((dir / "grey.png").c_str(), 2, 2, 1, grey.data(), 2), 0);
  std::vector<std::uint8_t> orange;
  for (int i = 0; i < 16 * 16; ++i) {
    orange.insert(orange.end(), {200, 100, 50});
  }
  ASSERT_NE(stbi_write_jpg((dir / "b.jpg").c_str(), 16, 16, 3, orange.data(), 95), 0);
  gl::RgbaImage tiff{4, 2, {}};
  for (int i = 0; i < 8; ++i) {
    tiff.pixels.insert(tiff.pixels.end(),
                       {static_cast<std::uint8_t>(i * 30), 7, static_cast<std::uint8_t>(i), 255});
  }
  ASSERT_TRUE(gl::writeColorTiff(dir / "c.TIF", tiff));
  ASSERT_TRUE(gl::writeDepthTiff(dir / "depth.tif", gl::DepthImage{3, 1, {0, 32896, 65535}}));

  Error error;
  const auto png = decodeImageFile(dir / "a.png", &error);
  ASSERT_TRUE(png) << error.message;
  EXPECT_EQ(png->width, 5);
  EXPECT_EQ(png->height, 3);
  EXPECT_EQ(png->pixels, rgba);
  const auto greyPng = decodeImageFile(dir / "grey.png", &error);
  ASSERT_TRUE(greyPng) << error.message;
  EXPECT_EQ(pixelAt(*greyPng, 1, 0), (Rgba{80, 80, 80, 255}));
  EXPECT_EQ(pixelAt(*greyPng, 0, 1), (Rgba{160, 160, 160, 255}));

  const auto jpeg = decodeImageFile(dir / "b.jpg", &error);
  ASSERT_TRUE(jpeg) << error.message;
  EXPECT_EQ(jpeg->width, 16);
  EXPECT_EQ(jpeg->height, 16);
  for (int y : {0, 8, 15}) {
    const Rgba p = pixelAt(*jpeg, y, y);
    EXPECT_NEAR(p[0], 200, 6);
    EXPECT_NEAR(p[1], 100, 6);
    EXPECT_NEAR(p[2], 50, 6);
    EXPECT_EQ(p[3], 255);
  }

  const auto colourTiff = decodeImageFile(dir / "c.TIF", &error);
  ASSERT_TRUE(colourTiff) << error.message;
  EXPECT_EQ(colourTiff->width, 4);
  EXPECT_EQ(colourTiff->height, 2);
  EXPECT_EQ(colourTiff->pixels, tiff.pixels);
  const auto depthTiff = decodeImageFile(dir / "depth.tif", &error);
  ASSERT_TRUE(depthTiff) << error.message;
  EXPECT_EQ(pixelAt(*depthTiff, 0, 0), (Rgba{0, 0, 0, 255}));
  EXPECT_EQ(pixelAt(*depthTiff, 1, 0), (Rgba{128, 128, 128, 255}));
  EXPECT_EQ(pixelAt(*depthTiff, 2, 0), (Rgba{255, 255, 255, 255}));

  for (const auto& [name, w, h] : {std::tuple{"a.png", 5, 3}, std::tuple{"b.jpg", 16, 16},
                                   std::tuple{"c.TIF", 4, 2}, std::tuple{"depth.tif", 3, 1}}) {
    int width = 0, height = 0;
    EXPECT_TRUE(readImageSize(dir / name, &width, &height)) << name;
    EXPECT_EQ(width, w) << name;
    EXPECT_EQ(height, h) << name;
  }
}

TEST(ImageFile, ABrokenOrMissingFileFailsNamingTheFile) {
  TempDir dir;
  writeSolidPng(dir / "whole.png", 64, {1, 2, 3, 255});
  const std::string png = testing::readFile(dir / "whole.png");
  ASSERT_GT(png.size(), 100u);
  writeFile(dir / "truncated.png", png.substr(0, png.size() / 2));
  writeFile(dir / "header-only.png", png.substr(0, 33));
  writeFile(dir / "text.png", "this is not a picture\n");
  writeFile(dir / "empty.tif", "");
  writeFile(dir / "empty.jpg", "");
  writeFile(dir / "text.tiff", std::string("II*\0\x08\0\0\0", 8) + "garbage, no directory");
  fs::create_directory(dir / "folder.png");

  for (const char* name : {"missing.png", "truncated.png", "header-only.png", "text.png",
                           "empty.tif", "empty.jpg", "text.tiff", "folder.png"}) {
    Error error;
    EXPECT_FALSE(decodeImageFile(dir / name, &error)) << name;
    EXPECT_EQ(error.domain, kImageSequenceErrorDomain) << name;
    EXPECT_NE(error.message.find((dir / name).string()), std::string::npos) << error.message;
    const bool missing = std::string(name) == "missing.png";
    EXPECT_NE(error.message.find(missing ? "no such file" : "not an image"), std::string::npos)
        << error.message;
    int width = -1, height = -1;
    // The header of a truncated picture may still be whole.
    if (std::string(name) != "truncated.png" && std::string(name) != "header-only.png") {
      EXPECT_FALSE(readImageSize(dir / name, &width, &height)) << name;
    }
  }
}

// Frames of `size` pixels square, each its own solid colour, named
// frame_000.png and on; TIFF files when `tiff` is set (written much faster
// than PNG at larger sizes).
fs::path writeSolidFrames(const TempDir& dir, int count, int size, bool tiff = false) {
  for (int i = 0; i < count; ++i) {
    char name[32];
    std::snprintf(name, sizeof name, "frame_%03d.%s", i, tiff ? "tif" : "png");
    if (!tiff) {
      writeSolidPng(dir / name, size, colourOf(i));
      continue;
    }
    EXPECT_TRUE(
        gl::writeColorTiff(dir / name, gl::RgbaImage{size, size, solidPixels(size, colourOf(i))}));
  }
  return dir / (tiff ? "frame_%03d.tif" : "frame_%03d.png");
}

TEST(ImageSequenceDecoder, PlaybackShowsEachFramesOwnPictureWithinTheBudget) {
  TempDir dir;
  constexpr int kFrames = 40, kBudget = 4;
  const auto sequence =
      ImageSequence::resolve(writeSolidFrames(dir, kFrames, 64).string(), nullptr);
  ASSERT_TRUE(sequence);
  ASSERT_TRUE(fs::remove(sequence->fileForFrame(7)));

  std::mutex mutex;
  std::set<int> done;
  {
    ImageSequenceDecoder decoder(*sequence, kBudget);
    decoder.setFrameDoneHandler([&](int index) {
      std::lock_guard lock(mutex);
      done.insert(index);
    });
    auto withinBudget = [&] {
      EXPECT_LE(decoder.framesHeld(), kBudget);
      EXPECT_LE(decoder.bytesHeld(), std::size_t{kBudget} * 64 * 64 * 4);
    };
    for (int i = 0; i < kFrames; ++i) {
      decoder.request(i);
      withinBudget();
      const ImageSequenceDecoder::Frame frame = decoder.waitFor(i);
      withinBudget();
      if (i == 7) {
        EXPECT_EQ(frame.state, ImageSequenceDecoder::State::Failed);
        EXPECT_NE(frame.error.find("frame_007.png"), std::string::npos) << frame.error;
        // A failed frame is not read again while it is held, even once its
        // file is back.
        writeSolidPng(sequence->fileForFrame(7), 64, colourOf(7));
        EXPECT_EQ(decoder.request(7).state, ImageSequenceDecoder::State::Failed);
        EXPECT_EQ(decoder.waitFor(7).state, ImageSequenceDecoder::State::Failed);
        continue;
      }
      ASSERT_EQ(frame.state, ImageSequenceDecoder::State::Ready) << i << ": " << frame.error;
      EXPECT_EQ(frame.image->width, 64);
      EXPECT_TRUE(isSolid(*frame.image, colourOf(i))) << i;
    }
    // Before the first frame and after the last, the ends are shown.
    EXPECT_TRUE(isSolid(*decoder.waitFor(-5).image, colourOf(0)));
    EXPECT_TRUE(isSolid(*decoder.waitFor(1000).image, colourOf(kFrames - 1)));
    withinBudget();

    // Dropped since, and asked for again, the failed frame is read again.
    const ImageSequenceDecoder::Frame retried = decoder.waitFor(7);
    ASSERT_EQ(retried.state, ImageSequenceDecoder::State::Ready) << retried.error;
    EXPECT_TRUE(isSolid(*retried.image, colourOf(7)));
    withinBudget();
  }
  // The decoder is gone, so every handler call it made has returned.
  EXPECT_EQ(done.size(), static_cast<std::size_t>(kFrames));
}

TEST(ImageSequenceDecoder, DestroyingItWhileFramesDecodeIsClean) {
  TempDir dir;
  const auto sequence = ImageSequence::resolve(writeSolidFrames(dir, 40, 128).string(), nullptr);
  ASSERT_TRUE(sequence);
  int calls = 0;
  std::mutex mutex;
  for (int round = 0; round < 20; ++round) {
    ImageSequenceDecoder decoder(*sequence, 8);
    decoder.setFrameDoneHandler([&](int) {
      std::lock_guard lock(mutex);
      ++calls;
    });
    decoder.request(round);
    decoder.request(39 - round);
    if (round % 2 == 0) {
      decoder.waitFor(round);
    }
  }
  EXPECT_GE(calls, 10);
}

// The process's resident memory, from /proc/self/statm; 0 where it cannot
// be read.
std::size_t residentBytes() {
  std::ifstream statm("/proc/self/statm");
  std::size_t pages = 0, resident = 0;
  statm >> pages >> resident;
  return resident * static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
}

TEST(ImageSequenceDecoder, MemoryStaysBoundedOverALongSequence) {
  TempDir dir;
  constexpr int kFrames = 120, kSize = 512, kBudget = 6;
  const auto sequence =
      ImageSequence::resolve(writeSolidFrames(dir, kFrames, kSize, true).string(), nullptr);
  ASSERT_TRUE(sequence);
  ImageSequenceDecoder decoder(*sequence, kBudget);
  constexpr std::size_t kFrameBytes = std::size_t{kSize} * kSize * 4;
  std::size_t atFrame20 = 0, largest = 0;
  for (int i = 0; i < kFrames; ++i) {
    const ImageSequenceDecoder::Frame frame = decoder.waitFor(i);
    ASSERT_EQ(frame.state, ImageSequenceDecoder::State::Ready) << frame.error;
    EXPECT_EQ(pixelAt(*frame.image, kSize - 1, kSize - 1), colourOf(i)) << i;
    EXPECT_LE(decoder.bytesHeld(), kBudget * kFrameBytes);
    if (i == 20) {
      atFrame20 = residentBytes();
    }
    largest = std::max(largest, residentBytes());
  }
#if defined(__SANITIZE_ADDRESS__)
  GTEST_SKIP() << "resident memory holds AddressSanitizer's quarantine of freed pictures";
#endif
  ASSERT_GT(atFrame20, 0u);
  // Every picture decoded stays resident if any leaks: 100 frames, 100 MiB.
  EXPECT_LT(largest - atFrame20, 3 * kBudget * kFrameBytes);
}

}  // namespace
}  // namespace cloudreel
