#include "import/bundler_file.h"

#include <gtest/gtest.h>
#include <stb/stb_image_write.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
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

// The readings every file is read with: one per core, one thread, and two
// threads on blocks so small that points cross their ends.
const BundlePointReading kReadings[] = {{}, {1}, {2, 16}, {3, 5}};

// Every case paired with every reading.
template <typename Case, std::size_t N>
std::vector<std::pair<Case, BundlePointReading>> casesWithReadings(const Case (&cases)[N]) {
  std::vector<std::pair<Case, BundlePointReading>> pairs;
  for (const Case& c : cases) {
    for (const BundlePointReading& reading : kReadings) pairs.emplace_back(c, reading);
  }
  return pairs;
}

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
  const std::string absurd = "#\n2000000000 0\n" + kCamera + points(1);
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
      // No reconstruction has that many cameras in so few bytes.
      {"absurd camera count", absurd,
       "The file claims 2000000000 cameras, more than a reconstruction of " +
           std::to_string(absurd.size()) + " bytes has",
       0, 0},
      {"absurd point count", "#\n1 2000000000\n" + kCamera + points(1), "", 1, 1},
      {"negative counts", "#\n-3 -1\n" + kCamera + points(1), "", 0, 0},
      // The camera's text is read as points.
      {"words for numbers", "#\nmany 2\n" + kCamera, "", 0, 2},
      {"words in a point", "#\n0 2\nx y z\nr g b\n\n" + points(1), "", 0, 2},
  };
  for (const auto& [c, reading] : casesWithReadings(cases)) {
    SCOPED_TRACE(c.name + ", " + std::to_string(reading.threads) + " threads");
    const auto url = dir / c.name;
    if (c.name != "missing") {
      writeFile(url, c.text);
    }
    BundlerFile layer;
    layer.setPointReading(reading);
    Error error;
    EXPECT_EQ(layer.loadPointsFromURLError(url, &error), !c.error.empty());
    // The application's own domain, not the point file's "myDomain".
    EXPECT_EQ(error, (c.error.empty() ? Error{} : Error{"Cloudreel", 100, c.error}));
    EXPECT_EQ(fieldCameras(layer).size(), std::size_t(c.cameras));
    EXPECT_EQ(layer.ncameras(), c.cameras);
    EXPECT_EQ(layer.nPoints(), c.points);
    // Never more memory than the file could fill.
    if (layer.pointArray()) {
      EXPECT_LE(layer.pointArray()->size(), 16 * c.text.size() / 11);
    }
  }
}

// A point seen by many cameras has a long view list; the rest of a colour
// line may be long too. Both are skipped whole, wherever the reading's
// buffer ends, so the points after them are read in step.
TEST(BundlerFile, LongViewListsAreSkippedWhole) {
  const testing::TempDir dir;
  for (const auto& [length, reading] : casesWithReadings({511u, 512u, 5000u, 200000u})) {
    SCOPED_TRACE(std::to_string(length) + ", " + std::to_string(reading.threads) + " threads");
    std::string views;
    while (views.size() < length) views += "2 0 12 3.5 -1 ";
    views.resize(length);
    const std::string tail(length, 'x');
    const auto url = writeFile(dir / "views.out", "#\n0 3\n1 2 3\n4 5 6\n" + views + "\n7 8 9\n" +
                                                      "10 11 12 " + tail + "\n" + views +
                                                      "\n13 14 15\n16 17 18\n" + views + "\n");
    BundlerFile layer;
    layer.setPointReading(reading);
    ASSERT_FALSE(layer.loadPointsFromURLError(url, nullptr));
    std::vector<std::array<int, 4>> points;
    for (const color_point& p : layer.colorPoints()) points.push_back({int(p.x), p.r, p.g, p.b});
    EXPECT_EQ(points,
              (std::vector<std::array<int, 4>>{{1, 4, 5, 6}, {7, 10, 11, 12}, {13, 16, 17, 18}}));
  }
}

// Camera i takes line i of list.txt. A name that is no file under the root
// (a path of the machine the list was written on) falls back to its longest
// trailing part that is one; a name that is one keeps it.
TEST(BundlerFile, PhotographsNamedByAnotherMachinesPathsAreFoundUnderTheRoot) {
  const testing::TempDir root;
  std::filesystem::create_directories(root / "images/sub.png");
  const std::vector<std::uint8_t> grey(5 * 2, 99);
  for (const auto& [name, width] : {std::pair{"images/a.png", 2}, {"a.png", 3}, {"b.png", 4}}) {
    ASSERT_NE(stbi_write_png((root / name).c_str(), width, 2, 1, grey.data(), width), 0);
  }
  const struct {
    std::string line;
    int width;  // 0: no photograph
  } cases[] = {
      {"images/a.png 0 1234.5", 2},
      {"/images/a.png", 2},
      {"a.png", 3},
      {"/home/x/proj/images/a.png 0 1234.5", 2},
      {"C:/data/images/a.png", 2},
      {"/home/x//proj/other/b.png", 4},
      {"/home/x/proj/images/missing.png", 0},
      {"/home/x/proj/images/sub.png", 0},
      {"/home/x/proj/images/", 0},
      {"", 0},
  };
  std::string list, cameras;
  for (const auto& c : cases) {
    list += c.line + "\n";
    cameras += kCamera;
  }
  writeFile(root / "list.txt", list);
  const auto url = writeFile(root / "bundle/bundle.out",
                             "#\n" + std::to_string(std::size(cases)) + " 0\n" + cameras);
  const auto layer = BundlerFile::initWithURLShouldLink(url, false);
  ASSERT_TRUE(layer);
  const auto made = fieldCameras(*layer);
  ASSERT_EQ(made.size(), std::size(cases));
  for (std::size_t i = 0; i < made.size(); ++i) {
    const auto& camera = dynamic_cast<const BundlerCamera&>(*made[i]);
    EXPECT_EQ(camera.imageWidth(), cases[i].width) << cases[i].line;
    EXPECT_EQ(camera.hasImage(), cases[i].width > 0) << cases[i].line;
  }
}

// What importing `url` in a child process costs: the growth of its peak
// resident memory in bytes, and the cameras it made. The child first
// imports a one-camera file of its own, so that what the first import of a
// process touches once (code pages, the allocator's arenas) is not counted
// as the cost of `url`.
struct ImportCost {
  long long peakGrowth = -1;
  long long cameras = -1;
  long long points = -1;
};

ImportCost importInAChild(const std::filesystem::path& url) {
  const testing::TempDir warm;
  const auto warmUp = writeFile(warm / "bundle/bundle.out", "#\n1 0\n" + kCamera);
  int out[2];
  if (::pipe(out) != 0) return {};
  const pid_t child = ::fork();
  if (child == 0) {
    ::close(out[0]);
    {
      BundlerFile first;
      (void)first.loadPointsFromURLError(warmUp, nullptr);
    }
    rusage before{}, after{};
    ::getrusage(RUSAGE_SELF, &before);
    BundlerFile layer;
    (void)layer.loadPointsFromURLError(url, nullptr);
    ::getrusage(RUSAGE_SELF, &after);
    // ru_maxrss counts kibibytes.
    const ImportCost cost{(after.ru_maxrss - before.ru_maxrss) * 1024LL, layer.ncameras(),
                          layer.nPoints()};
    const bool sent = ::write(out[1], &cost, sizeof cost) == ssize_t(sizeof cost);
    ::_exit(sent ? 0 : 1);
  }
  ::close(out[1]);
  ImportCost cost;
  if (child < 0 || ::read(out[0], &cost, sizeof cost) != ssize_t(sizeof cost)) cost = {};
  ::close(out[0]);
  int status = 0;
  if (child > 0) ::waitpid(child, &status, 0);
  return cost;
}

// A camera is a placed object of some 2.3 KB (its transforms and their
// observation, mostly) and every 30 bytes of zeros begin one. A count no
// real reconstruction of the file's size has is refused before anything is
// made; the largest count a file may claim costs about ten times its size.
// The photograph list is held as its text, whatever its lines.
TEST(BundlerFile, AHostileFileOrListClaimsMemoryOnlyInProportionToItsSize) {
  const testing::TempDir root;
  std::string zeros;
  for (int i = 0; i < 450000; ++i) zeros += "0 ";
  const auto bundle = writeFile(root / "bundle/bundle.out", "#\n2000000000 0\n" + zeros);
  BundlerFile refused;
  Error error;
  EXPECT_TRUE(refused.loadPointsFromURLError(bundle, &error));
  EXPECT_EQ(error.message, "The file claims 2000000000 cameras, more than a reconstruction of " +
                               std::to_string(zeros.size() + 15) + " bytes has");
  EXPECT_EQ(refused.childLayerCount(), 0);
#if defined(__SANITIZE_ADDRESS__)
  GTEST_SKIP() << "resident memory is not the program's own under AddressSanitizer";
#endif
  const std::string header = "#\n3500 0\n";
  writeFile(bundle, header + zeros);
  const ImportCost cameras = importInAChild(bundle);
  EXPECT_EQ(cameras.cameras, 3500);
  EXPECT_LE(cameras.peakGrowth, 12 * static_cast<long long>(header.size() + zeros.size()));

  const std::string list(8 << 20, '\n');
  writeFile(root / "list.txt", list);
  writeFile(bundle, header + zeros.substr(0, 30 * 100));
  const ImportCost photographs = importInAChild(bundle);
  EXPECT_EQ(photographs.cameras, 100);
  EXPECT_LE(photographs.peakGrowth, 4 * static_cast<long long>(list.size()));
}

// The points are read a block of text at a time, on every core: the import
// holds its points and a block or so of the file, never the file.
TEST(BundlerFile, ALargeFileCostsTheMemoryOfItsPointsNotOfItsText) {
  const testing::TempDir root;
  std::string views = "300";
  for (int v = 0; v < 300; ++v) views += " 17 2345 -120.25 99.5";
  std::string text = "# Bundle file v0.3\n1 4000\n" + kCamera;
  for (int i = 0; i < 4000; ++i) {
    text += "1.5e-3 " + std::to_string(i) + " 2\n10 20 30\n" + views + "\n";
  }
  const auto url = writeFile(root / "bundle/bundle.out", text);
#if defined(__SANITIZE_ADDRESS__)
  GTEST_SKIP() << "resident memory is not the program's own under AddressSanitizer";
#endif
  const ImportCost cost = importInAChild(url);
  EXPECT_EQ(cost.points, 4000);
  // The file is 25 MB, its points 64 KB, the text held at most 2 MiB.
  EXPECT_LE(cost.peakGrowth, static_cast<long long>(text.size() / 5));
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
    // One camera field, however often the layer is opened: reading the file
    // again refills the field the document already knows.
    ASSERT_EQ(decoded->childLayerCount(), 1);
    const auto field = std::dynamic_pointer_cast<CameraField>(decoded->childLayers()[0]);
    ASSERT_TRUE(field);
    EXPECT_EQ(field->cameras().size(), 1U);
    const auto again = testing::roundTrip(decoded);
    ASSERT_TRUE(again);
    EXPECT_EQ(again->childLayerCount(), 1);
  }
}

}  // namespace
}  // namespace cloudreel
