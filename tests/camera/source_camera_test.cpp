#include "camera/source_camera.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>
#include <stb/stb_image_write.h>

#include <array>
#include <cmath>
#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

#include "camera/bundler_camera.h"
#include "import/text_scanner.h"
#include "platform/byte_stream.h"
#include "platform/log.h"
#include "scene/archive_helpers.h"
#include "support/pixel_harness.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

using testing::Frame;
using testing::Rgba;

// A PNG of `w` × `h` pixels, the top `red` rows red and the rest blue, with
// `channels` 3 or 4.
std::filesystem::path writePng(const std::filesystem::path& path, int w, int h, int channels = 3,
                               int red = 0) {
  std::vector<std::uint8_t> pixels;
  for (int y = 0; y < h; ++y) {
    for (int x = 0; x < w; ++x) {
      const std::array<std::uint8_t, 4> c{y < red ? std::uint8_t{255} : std::uint8_t{0}, 0,
                                          y < red ? std::uint8_t{0} : std::uint8_t{255}, 255};
      pixels.insert(pixels.end(), c.begin(), c.begin() + channels);
    }
  }
  EXPECT_NE(stbi_write_png(path.c_str(), w, h, channels, pixels.data(), w * channels), 0);
  return path;
}

// A PNG cut after its header chunk: the size is there, the pixels are not.
std::filesystem::path writeHeaderOnlyPng(const std::filesystem::path& path, int w, int h) {
  writePng(path, w, h);
  std::filesystem::resize_file(path, 33);
  return path;
}

TEST(SourceCamera, ThePhotographsSizeComesFromItsHeaderAndAFailedLoadLeavesNone) {
  const testing::TempDir dir;
  const std::vector<std::uint8_t> grey(640 * 480, 128);
  ASSERT_NE(stbi_write_jpg((dir / "a.jpg").c_str(), 640, 480, 1, grey.data(), 90), 0);
  const struct {
    std::filesystem::path path;
    int width, height;  // 0 × 0: no photograph
  } cases[] = {
      {dir / "a.jpg", 640, 480},
      {writePng(dir / "b.png", 3, 5, 4), 3, 5},
      // Only the header is read, so a photograph whose pixels are damaged
      // still counts until it is drawn.
      {writeHeaderOnlyPng(dir / "cut.png", 7, 2), 7, 2},
      {testing::writeFile(dir / "notes.txt", "not a picture"), 0, 0},
      {dir / "missing.jpg", 0, 0},
      {"", 0, 0},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.path);
    SourceCamera camera;
    camera.setImagePath(dir / "a.jpg");
    camera.setImagePath(c.path);
    EXPECT_EQ(camera.hasImage(), c.width > 0);
    EXPECT_EQ(camera.imageWidth(), c.width);
    EXPECT_EQ(camera.imageHeight(), c.height);
    if (c.width > 0) {
      EXPECT_FLOAT_EQ(camera.aspect(), float(c.width) / float(c.height));
    }
  }
}

TEST(SourceCamera, TheFieldOfViewFollowsTheFocalLengthAndThePhotographsWidth) {
  const testing::TempDir dir;
  SourceCamera camera;
  camera.setFocal(500);
  camera.setFieldOfView(30);  // a plain camera's stored value, not used
  // Without a photograph the width counts as 0.
  EXPECT_NEAR(camera.fieldOfView(), 2 * std::atan(-1.0 / 1000) * 180 / M_PI, 1e-5);
  camera.setImagePath(writePng(dir / "wide.png", 1001, 1));
  EXPECT_FLOAT_EQ(camera.fieldOfView(), 90.0f);
  EXPECT_FLOAT_EQ(camera.fieldOfViewInRadians(), float(M_PI / 2));
  // Key-value readers (timeline tracks, panels) see the derived value too.
  EXPECT_EQ(std::get<float>(camera.valueForKey("fieldOfView")), 90.0f);
  // So do the cameras a camera path copies from it for its frames.
  EXPECT_FLOAT_EQ(copyOf(camera)->fieldOfView(), 90.0f);
}

using SourceCameraDrawing = testing::PixelTest;

TEST_F(SourceCameraDrawing, ASelectedCameraShowsItsPhotographUprightAtTheEndOfItsFrustum) {
  const testing::TempDir dir;
  constexpr Rgba kRed{255, 0, 0, 255}, kBlue{0, 0, 255, 255};
  const struct {
    std::filesystem::path photograph;
    bool selected;
    Rgba top, bottom;  // black: nothing drawn
  } cases[] = {
      // 9 × 8 at focal 4: a 90° view, so at length 1 the quad spans ±1 by
      // ±8/9, 40 pixels a unit.
      {writePng(dir / "photo.png", 9, 8, 3, 4), true, kRed, kBlue},
      {dir / "photo.png", false, testing::kBlack, testing::kBlack},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(::testing::Message() << c.photograph << ", selected " << c.selected);
    SourceCamera camera;
    camera.setFocal(4);
    camera.setImagePath(c.photograph);
    camera.setSelected(c.selected);
    const Frame frame = render(101, 101, [&] {
      glScaled(40, 40, 40);
      camera.drawImageWithFrustumLength(1, 1);
    });
    EXPECT_TRUE(testing::pixelIs(frame, 50, 30, c.top, 2));
    EXPECT_TRUE(testing::pixelIs(frame, 50, 70, c.bottom, 2));
    if (c.top != testing::kBlack) {
      EXPECT_TRUE(testing::boundsNear(frame.drawnBounds(), {10, 15, 91, 86}, 1));
    }
  }
}

// A PNG whose image data does not begin a zlib stream: the header reads,
// the pixels do not.
std::filesystem::path writeCorruptPng(const std::filesystem::path& path, int w, int h) {
  writePng(path, w, h);
  std::string bytes = testing::readFile(path);
  const std::size_t data = bytes.find("IDAT") + 4;
  bytes[data] = bytes[data + 1] = '\xff';
  return testing::writeFile(path, bytes);
}

// Found out at the first draw, which shows nothing, as no later draw does;
// the camera is then one without a photograph, and so are its copies.
TEST_F(SourceCameraDrawing, APhotographWhosePixelsDoNotDecodeIsDroppedAtTheFirstDraw) {
  const testing::TempDir dir;
  for (const auto& photograph :
       {writeHeaderOnlyPng(dir / "cut.png", 9, 8), writeCorruptPng(dir / "corrupt.png", 9, 8)}) {
    SCOPED_TRACE(photograph);
    SourceCamera camera;
    camera.setFocal(4);
    camera.setImagePath(photograph);
    camera.setSelected(true);
    ASSERT_TRUE(camera.hasImage());
    const CapturedLog log;
    const auto draw = [&](SourceCamera& drawn) {
      return render(101, 101,
                    [&] {
                      glScaled(40, 40, 40);
                      drawn.drawImageWithFrustumLength(1, 1);
                    })
          .countDrawn();
    };
    EXPECT_EQ(draw(camera), 0);
    EXPECT_EQ(draw(camera), 0);
    EXPECT_FALSE(camera.hasImage());
    EXPECT_EQ((std::array{camera.imageWidth(), camera.imageHeight()}), (std::array{0, 0}));
    EXPECT_EQ(camera.aspect(), 1.0f);
    EXPECT_EQ(log.count("cannot decode photograph"), 1) << ::testing::PrintToString(log.lines());
    const auto copy = copyOf(camera);
    copy->setSelected(true);
    EXPECT_FALSE(copy->hasImage());
    EXPECT_EQ(draw(*copy), 0);
    EXPECT_EQ(log.count("cannot decode photograph"), 1);
  }
}

// The camera read from a record, as a scanner over the text.
std::shared_ptr<BundlerCamera> readCamera(const std::string& record, int index = 0) {
  MemoryInputStream in({reinterpret_cast<const std::uint8_t*>(record.data()), record.size()});
  TextScanner scanner(in);
  return BundlerCamera::initWithFileHandleFileIndex(scanner, index);
}

TEST(BundlerCamera, ARecordPlacesTheCameraWhereItsRotationAndTranslationSay) {
  const struct {
    std::string record;
    double focal, k1;
    std::array<double, 3> centre;
  } cases[] = {
      {"500 0.1 -0.2\n1 0 0\n0 1 0\n0 0 1\n0 0 -5\n", 500, 0.1, {0, 0, 5}},
      // Turned a quarter about z and tilted: the centre is −Rᵀ·t.
      {"800 0 0\n0 1 0\n-0.6 0 0.8\n0.8 0 0.6\n1 2 3\n", 800, 0, {-1.2, -1, -3.4}},
      // Cut short: the values the file lacks are 0.
      {"700 0.5 0\n1 0 0\n", 700, 0.5, {0, 0, 0}},
      // A field that is no number reads as 0 and the rest stays in step.
      {"abc 0.3 0\n1 0 0\n0 1 0\n0 0 1\n0 x -2\n", 0, 0.3, {0, 0, 2}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.record);
    const auto camera = readCamera(c.record, 7);
    EXPECT_EQ(camera->focal(), c.focal);
    EXPECT_EQ(camera->k1(), c.k1);
    EXPECT_EQ(camera->number(), 7);
    for (std::size_t i = 0; i < 3; ++i) {
      EXPECT_NEAR(camera->objectToWorld()->mx()[12 + i], c.centre[i], 1e-12) << "component " << i;
    }
  }
  // What the camera sees in front of it is where R·X + t puts it.
  const auto camera = readCamera(cases[1].record);
  for (const std::array<double, 3>& seen : {std::array<double, 3>{0, 0, -1}, {1, 2, -3}}) {
    std::array<double, 3> world = seen;
    camera->transformation()->multiply3Vector(world);
    const double r[3][3] = {{0, 1, 0}, {-0.6, 0, 0.8}, {0.8, 0, 0.6}}, t[3] = {1, 2, 3};
    for (std::size_t i = 0; i < 3; ++i) {
      EXPECT_NEAR(r[i][0] * world[0] + r[i][1] * world[1] + r[i][2] * world[2] + t[i], seen[i],
                  1e-12);
    }
  }
}

TEST(BundlerCamera, AnArchivedCameraKeepsItsLensIndexAndSelectionButNotItsPhotograph) {
  const testing::TempDir dir;
  const auto camera = readCamera("512.5 0.25 -0.125\n1 0 0\n0 1 0\n0 0 1\n0 0 -5\n", 3);
  camera->setImagePath(writePng(dir / "p.png", 4, 2));
  camera->setSelected(true);
  const auto decoded = testing::roundTrip(camera);
  ASSERT_TRUE(decoded);
  EXPECT_EQ(decoded->className(), "BundlerCamera");
  EXPECT_EQ(decoded->fileIndex(), 3);
  EXPECT_TRUE(decoded->selected());
  const std::array<double, 3> lens{decoded->focal(), decoded->k1(), decoded->k2()};
  EXPECT_EQ(lens, (std::array<double, 3>{512.5, 0.25, -0.125}));
  EXPECT_FALSE(decoded->hasImage());
  EXPECT_EQ(decoded->positionZ(), 5.0f);
}

}  // namespace
}  // namespace cloudreel
