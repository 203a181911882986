#include "import/bundler_file.h"

#include <gtest/gtest.h>
#include <stb/stb_image_write.h>

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

#include "camera/bundler_camera.h"
#include "camera/camera_field.h"
#include "scene/archive_helpers.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

// Looks at the origin from (0, 0, 5).
const std::string kCamera = "500 0 0\n1 0 0\n0 1 0\n0 0 1\n0 0 -5\n";

std::string points(int count) {
  std::string text;
  for (int i = 0; i < count; ++i) {
    text += std::to_string(i % 7) + " " + std::to_string(-i) + " 0.5\n10 20 30\n1 0 12 3.5 -1\n";
  }
  return text;
}

using testing::writeFile;

std::vector<std::shared_ptr<Camera>> fieldCameras(const BundlerFile& layer) {
  const auto field = layer.childLayerCount() > 0
                         ? std::dynamic_pointer_cast<CameraField>(layer.childLayers()[0])
                         : nullptr;
  return field ? field->cameras() : std::vector<std::shared_ptr<Camera>>{};
}

TEST(BundlerFile, AReconstructionGivesItsPointsAndItsCamerasWithTheirPhotographs) {
  const testing::TempDir root;
  std::filesystem::create_directories(root / "images");
  const std::vector<std::uint8_t> grey(20 * 10, 99);
  ASSERT_NE(stbi_write_jpg((root / "images/a.jpg").c_str(), 20, 10, 1, grey.data(), 90), 0);
  // One line for three cameras: the others get no photograph.
  writeFile(root / "list.txt", "images/a.jpg 0 1234.5\n");
  const auto url = writeFile(root / "bundle/bundle.out",
                             "# Bundle file v0.3\n3 300\n" + kCamera + kCamera + kCamera +
                                 "-4 9 2.5\n300 -1 128\n2 0 5 1.5 2.5 1 7 0.1 0.2\n" + points(299));

  const auto layer = BundlerFile::initWithURLShouldLink(url, false);
  ASSERT_TRUE(layer);
  EXPECT_EQ(layer->name(), "bundle.out");
  const auto cameras = fieldCameras(*layer);
  ASSERT_EQ(cameras.size(), 3u);
  EXPECT_EQ(layer->ncameras(), 3);
  for (int i = 0; i < 3; ++i) {
    const auto& camera = dynamic_cast<const BundlerCamera&>(*cameras[std::size_t(i)]);
    EXPECT_EQ(camera.number(), i);
    EXPECT_EQ(camera.imageWidth(), i == 0 ? 20 : 0);
  }

  const auto records = layer->colorPoints();
  ASSERT_EQ(records.size(), 300u);
  EXPECT_EQ(std::vector<int>({records[0].r, records[0].g, records[0].b}),
            std::vector<int>({44, 255, 128}));
  EXPECT_EQ(records[299].luck, 43);
  EXPECT_EQ(records[1].x, 0.0f);
  EXPECT_EQ(records[299].y, -298.0f);
  EXPECT_EQ(layer->bbox(), (Layer::BoundingBox{-4, -298, 0.5, 6, 9, 2.5}));
  EXPECT_TRUE(layer->cameras().empty());
}

TEST(BundlerFile, MissingEmptyDamagedAndBoastfulFilesGiveAnErrorOrWhatTheyHold) {
  const testing::TempDir dir;
  const struct {
    std::string name;
    std::string text;  // none: no file at all
    std::string error;
    int cameras, points;
  } cases[] = {
      {"missing", "", "Cannot open file", 0, 0},
      {"empty", "", "File corrupt: short read", 0, 0},
      {"cameras only", "#\n2 0\n" + kCamera + kCamera, "", 2, 0},
      // The third camera is begun, so it is made; there are no points.
      {"cut in a camera", "#\n3 4\n" + kCamera + kCamera + "600 0 0\n", "", 3, 0},
      {"cut in a point", "#\n1 4\n" + kCamera + points(2) + "5 6", "", 1, 3},
      // The points' text is read as the cameras the header promises.
      {"absurd camera count", "#\n2000000000 0\n" + kCamera + points(1), "", 2, 0},
      {"absurd point count", "#\n1 2000000000\n" + kCamera + points(1), "", 1, 1},
      {"negative counts", "#\n-3 -1\n" + kCamera + points(1), "", 0, 0},
      // The camera's text is read as points.
      {"words for numbers", "#\nmany 2\n" + kCamera, "", 0, 2},
      {"words in a point", "#\n0 2\nx y z\nr g b\n\n" + points(1), "", 0, 2},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    const auto url = dir / c.name;
    if (c.name != "missing") {
      writeFile(url, c.text);
    }
    BundlerFile layer;
    Error error;
    EXPECT_EQ(layer.loadPointsFromURLError(url, &error), !c.error.empty());
    EXPECT_EQ(error.message, c.error);
    EXPECT_EQ(error.code, c.error.empty() ? 0 : 100);
    EXPECT_EQ(fieldCameras(layer).size(), std::size_t(c.cameras));
    EXPECT_EQ(layer.ncameras(), c.cameras);
    EXPECT_EQ(layer.nPoints(), c.points);
    // Never more memory than the file could fill.
    if (layer.pointArray()) {
      EXPECT_LE(layer.pointArray()->size(), 16 * c.text.size() / 11);
    }
  }
}

TEST(BundlerFile, ALinkedLayerIsReadFromItsFileAgainWhenDecoded) {
  const testing::TempDir dir;
  const auto url = writeFile(dir / "b/bundle.out", "#\n1 5\n" + kCamera + points(5));
  for (const bool linked : {false, true}) {
    SCOPED_TRACE(linked ? "linked" : "inline");
    const auto layer = BundlerFile::initWithURLShouldLink(url, linked);
    ASSERT_TRUE(layer);
    const auto decoded = testing::roundTrip(layer);
    ASSERT_TRUE(decoded);
    EXPECT_EQ(decoded->nPoints(), 5);
    EXPECT_EQ(decoded->colorPoints()[4].y, -4.0f);
  }
}

}  // namespace
}  // namespace cloudreel
