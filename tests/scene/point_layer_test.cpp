#include "scene/point_layer.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstring>

#include "scene/archive_helpers.h"
#include "support/file_size_limit.h"
#include "support/memory_defaults.h"
#include "support/scripted_user_interaction.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

using testing::readFile;
using testing::writeFile;

// Application defaults in memory, the point cache in a temporary folder and
// a scripted user, for the length of a test.
class PointLayerTest : public ::testing::Test {
 protected:
  void SetUp() override {
    std::filesystem::create_directory(dir / "cache");
    UserDefaults::standardUserDefaults().setObjectForKey((dir / "cache").string(),
                                                         kPointCachePathKey);
    previousUser_ = UserInteraction::setShared(user);
  }
  void TearDown() override { UserInteraction::setShared(previousUser_); }

  // A layer of `n` points with distinct positions, colours and luck.
  static std::shared_ptr<PointLayer> layerOf(int n) {
    auto layer = std::make_shared<PointLayer>();
    layer->allocatePointArrayWithSize(n);
    layer->setNPoints(n);
    int i = 0;
    for (color_point& p : layer->colorPoints()) {
      p = {float(i),           float(2 * i),        float(-i),
           std::uint8_t(i),    std::uint8_t(i + 1), std::uint8_t(i + 2),
           std::uint8_t(7 * i)};
      ++i;
    }
    layer->setBoundingBoxWithMinXMaxXMinYMaxYMinZMaxZ(0, float(n), 0, float(2 * n), float(-n), 0);
    return layer;
  }
  static Bytes recordsOf(const PointLayer& layer) {
    return Bytes(layer.points(), layer.points() + layer.byteSize());
  }
  std::filesystem::path saved(const PointLayer& layer, std::string name = "cloud.rwb") {
    Error error;
    EXPECT_FALSE(layer.savePointsToURLError(dir / name, &error)) << error.message;
    return dir / name;
  }

  const testing::MemoryDefaults defaults;
  testing::TempDir dir;
  std::shared_ptr<testing::ScriptedUserInteraction> user =
      std::make_shared<testing::ScriptedUserInteraction>();

 private:
  std::shared_ptr<UserInteraction> previousUser_;
};

TEST_F(PointLayerTest, ThreePointsMakeA136ByteFileThatReadsBackTheSame) {
  const auto layer = layerOf(3);
  const std::string file = readFile(saved(*layer));
  ASSERT_EQ(file.size(), 136u);
  EXPECT_EQ(std::memcmp(file.data(), "RWBP\0\0\0\0\0\0\0\0\3\0\0\0", 16), 0);
  EXPECT_EQ(std::memcmp(file.data() + 88, layer->points(), 48), 0);

  PointLayer loaded;
  Error error;
  EXPECT_FALSE(loaded.loadPointsFromURLError(dir / "cloud.rwb", &error));
  EXPECT_EQ(error.message, "");
  EXPECT_EQ(loaded.nPoints(), 3);
  EXPECT_EQ(recordsOf(loaded), recordsOf(*layer));
  EXPECT_EQ(loaded.bbox(), layer->bbox());
}

TEST_F(PointLayerTest, BadFilesAreRefusedWithTheirMessageAndNothingHostileIsAllocated) {
  std::string good = readFile(saved(*layerOf(3)));
  good[20] = 2;  // two faces, whose indices are never reached
  const auto patched = [&](std::size_t offset, std::uint32_t value) {
    std::string b = good;
    std::memcpy(b.data() + offset, &value, 4);
    return b;
  };
  const struct {
    const char* what;
    std::string file;
    const char* message;
    int pointsAfter;  // -1: the layer keeps its own
  } cases[] = {
      {"version 1", patched(4, 1), "Unsupported RWB file version", -1},
      {"big-endian writer", patched(8, 0x01000000), "Wrong file endianness", -1},
      {"wrong magic", patched(0, 0x58585858), "Not a RWB file", -1},
      {"short header", good.substr(0, 39), "File is corrupt: short read", -1},
      {"cut in the box", good.substr(0, 60), "Cannot read bounding box", 0},
      {"cut in the records", good.substr(0, 88 + 40), "Cannot read points: short read", 2},
      {"a count of 2^32 - 1", patched(12, 0xffffffff), "Cannot read points: short read", 3},
  };
  for (const auto& c : cases) {
    writeFile(dir / "bad.rwb", c.file);
    const auto layer = layerOf(5);
    const Bytes before = recordsOf(*layer);
    Error error;
    // The result says success for a short read; only the error tells.
    layer->loadPointsFromURLError(dir / "bad.rwb", &error);
    EXPECT_EQ(error.domain, "myDomain") << c.what;
    EXPECT_EQ(error.code, 100) << c.what;
    EXPECT_EQ(error.message, c.message) << c.what;
    // A load that fails before the triangles claims no faces either.
    EXPECT_EQ(layer->nFaces(), 0) << c.what;
    if (c.pointsAfter < 0) {
      EXPECT_EQ(recordsOf(*layer), before) << c.what;
    } else {
      EXPECT_EQ(layer->nPoints(), c.pointsAfter) << c.what;
    }
  }
}

TEST_F(PointLayerTest, ALargeArrayIsZeroedToItsLastRecord) {
  // 48 MB: large enough to be mapped in huge pages rather than taken from
  // the heap, which must not change what the layer sees.
  constexpr std::int32_t n = 3'000'000;
  PointLayer layer;
  const std::uint8_t* data = layer.allocatePointArrayWithSize(n);
  ASSERT_NE(data, nullptr);
  ASSERT_EQ(layer.pointArray()->size(), std::size_t{n} * 16);
  EXPECT_EQ(std::find_if(data, data + std::size_t{n} * 16, [](std::uint8_t b) { return b != 0; }),
            data + std::size_t{n} * 16);
  // Replacing it releases it the way it was taken (under ASan, giving a
  // mapping to the heap's free would be reported).
  EXPECT_NE(layer.allocatePointArrayWithSize(3), nullptr);
}

TEST_F(PointLayerTest, AFaceCountBeyondTheFileKeepsTheWholeFacesThatAreThere) {
  std::string file = readFile(saved(*layerOf(3)));
  file[20] = 2;
  // Fewer bytes than one face: no triangles, and nothing is read into the
  // empty list (the loader once passed its null data to the stream).
  const struct {
    std::size_t indexBytes;
    int faces;
  } cases[] = {{4, 0}, {12, 1}, {20, 1}, {24, 2}};
  for (const auto& c : cases) {
    std::string withFaces = file;
    for (std::size_t i = 0; i < c.indexBytes; ++i) {
      withFaces.push_back(static_cast<char>(i / 4));
    }
    PointLayer layer;
    Error error;
    layer.loadPointsFromURLError(writeFile(dir / "faces.rwb", withFaces), &error);
    EXPECT_EQ(error.message, "") << c.indexBytes;
    EXPECT_EQ(layer.nFaces(), c.faces) << c.indexBytes;
    EXPECT_EQ(layer.triangles().size(), std::size_t(3 * c.faces)) << c.indexBytes;
  }
}

TEST_F(PointLayerTest, AMissingFileIsTakenFromTheCacheOrLocatedByTheUser) {
  const auto layer = layerOf(4);
  saved(*layer, "cache/cached.rwb");
  auto fromCache = PointLayer::initWithURLShouldLink(dir / "elsewhere/cached.rwb", true);
  ASSERT_TRUE(fromCache);
  EXPECT_EQ(fromCache->name(), "cached.rwb");
  EXPECT_EQ(recordsOf(*fromCache), recordsOf(*layer));
  EXPECT_TRUE(user->panels.empty());

  const auto located = saved(*layer, "located.rwb");
  user->answerOpenPanelWith(located.string());
  auto found = PointLayer::initWithURLShouldLink(dir / "lost.rwb", true);
  ASSERT_TRUE(found);
  ASSERT_EQ(user->panels.size(), 1u);
  EXPECT_EQ(user->panels[0].title, "Please locate lost.rwb");
  EXPECT_EQ(found->originalURL(), dir / "lost.rwb");  // not the located file

  EXPECT_FALSE(PointLayer::initWithURLShouldLink(dir / "lost.rwb", true));  // cancelled
  ASSERT_EQ(user->errors.size(), 1u);
  EXPECT_EQ(user->errors[0].message, "Cannot open file");
}

TEST_F(PointLayerTest, InlineLayersTravelInTheArchiveLinkedOnesReloadTheirFile) {
  const auto inlineLayer = layerOf(6);
  inlineLayer->setPointSize(3.5f);
  inlineLayer->setBucketLimit(0.25f);
  inlineLayer->setOpacity(0.3f);
  inlineLayer->setColorMode(1);
  const auto back = testing::roundTrip(inlineLayer);
  ASSERT_TRUE(back);
  EXPECT_EQ(recordsOf(*back), recordsOf(*inlineLayer));
  EXPECT_EQ(back->pointSize(), 3.5f);
  EXPECT_EQ(back->bucketLimit(), 0.25f);
  EXPECT_EQ(back->opacity(), 1.0f);  // opacity and colour mode are not saved
  EXPECT_EQ(back->colorMode(), 0);

  const auto linked = PointLayer::initWithURLShouldLink(saved(*layerOf(1000), "linked.rwb"), true);
  ASSERT_TRUE(linked);
  const Bytes archive = KeyedArchiver::archivedDataWithRootObject(linked);
  EXPECT_LT(archive.size(), 2000u);  // only the file's location travels, not 16,000 bytes
  const auto reloaded = testing::roundTrip(linked);
  ASSERT_TRUE(reloaded);
  EXPECT_EQ(recordsOf(*reloaded), recordsOf(*layerOf(1000)));

  // A linked file gone from everywhere fails the decode, after telling the
  // user.
  std::filesystem::remove(dir / "linked.rwb");
  Error error;
  EXPECT_FALSE(KeyedUnarchiver::unarchiveObjectWithData(archive, &error));
  EXPECT_EQ(user->errors.back().message, "Cannot open file: " + (dir / "linked.rwb").string());
  EXPECT_EQ(error.message, user->errors.back().message);
}

TEST_F(PointLayerTest, OlderDocumentsAndDamagedCountsReadSafely) {
  // An archive of an old layer: no bucket limit, no attenuation, and a
  // point count larger than its blob.
  const auto layer = testing::decodeFrom<PointLayer>("PointLayer", [](KeyedArchiver& coder) {
    coder.encodeInt32(1000000, "nPoints");
    coder.encodeBytes(Bytes(40, 7), "points");
  });
  ASSERT_TRUE(layer);
  EXPECT_EQ(layer->bucketLimit(), 1.0f);
  EXPECT_FALSE(layer->attenuatePoints());
  EXPECT_EQ(layer->atten_c(), 1.0f);
  EXPECT_EQ(layer->nPoints(), 2);  // the whole records the blob holds
  EXPECT_EQ(recordsOf(*layer), Bytes(32, 7));
}

TEST_F(PointLayerTest, CopiesShareTheRecordsAndDrawAsAPlainCloud) {
  const auto layer = layerOf(10);
  layer->setName("Scan");
  layer->setColorMode(1);
  layer->setOpacity(0.5f);
  const auto copy = copyOf(*layer);
  EXPECT_EQ(copy->className(), "PointLayer");
  EXPECT_EQ(copy->name(), "Scan copy");
  EXPECT_EQ(copy->pointArray(), layer->pointArray());
  EXPECT_EQ(copy->nPoints(), 10);
  EXPECT_EQ(copy->colorMode(), 0);
  EXPECT_EQ(copy->opacity(), 1.0f);
  // The records outlive the original.
  const Bytes records = recordsOf(*layer);
  std::weak_ptr<PointArray> array = layer->pointArray();
  layer->allocatePointArrayWithSize(1);
  EXPECT_EQ(recordsOf(*copy), records);
  copy->allocatePointArrayWithSize(1);
  EXPECT_TRUE(array.expired());
}

TEST_F(PointLayerTest, ReRandomizingRewritesOnlyTheLuck) {
  const auto layer = layerOf(2000);
  const Bytes before = recordsOf(*layer);
  layer->reRandomizeWithExponent(1.0f);
  int highest = 0;
  int distinct = 0;
  std::array<bool, 256> seen{};
  for (std::size_t i = 0; i < 2000; ++i) {
    const color_point& p = layer->colorPoints()[i];
    EXPECT_EQ(std::memcmp(&p, before.data() + 16 * i, 15), 0);
    highest = std::max<int>(highest, p.luck);
    distinct += seen[p.luck] ? 0 : 1;
    seen[p.luck] = true;
  }
  EXPECT_LE(highest, 254);
  EXPECT_GT(distinct, 200);
  layer->reRandomizeWithExponent(0.0f);
  for (const color_point& p : layer->colorPoints()) {
    ASSERT_EQ(p.luck, 255);
  }
}

TEST_F(PointLayerTest, SavingBackNeedsALinkAndClearsTheModifiedMark) {
  const auto inlineLayer = layerOf(3);
  inlineLayer->saveLinkedLayer();
  ASSERT_EQ(user->alerts.size(), 1u);
  EXPECT_EQ(user->alerts[0].messageText, "Cannot save");
  EXPECT_EQ(user->alerts[0].informativeText, "Not an externally linked layer");

  const auto path = saved(*layerOf(3), "back.rwb");
  const auto linked = PointLayer::initWithURLShouldLink(path, true);
  ASSERT_TRUE(linked);
  linked->colorPoints()[1].r = 99;
  linked->setIsModified(true);
  linked->saveLinkedLayer();
  EXPECT_FALSE(linked->isModified());
  EXPECT_EQ(readFile(path)[88 + 16 + 12], 99);
}

// Saving back through a link writes the file the link names and keeps its
// permissions; a save that fails says why and leaves the old file as it was.
TEST_F(PointLayerTest, SavesThroughLinksAndFailedSavesKeepTheOldFileAndSayWhy) {
  const auto real = saved(*layerOf(3), "real.rwb");
  std::filesystem::permissions(real, std::filesystem::perms::owner_read |
                                         std::filesystem::perms::owner_write);
  std::filesystem::create_symlink("real.rwb", dir / "link.rwb");
  const auto linked = PointLayer::initWithURLShouldLink(dir / "link.rwb", true);
  ASSERT_TRUE(linked);
  linked->colorPoints()[1].r = 99;
  linked->setIsModified(true);
  linked->saveLinkedLayer();
  EXPECT_TRUE(std::filesystem::is_symlink(dir / "link.rwb"));
  EXPECT_EQ(readFile(real)[88 + 16 + 12], 99);
  EXPECT_EQ(std::filesystem::status(real).permissions(),
            std::filesystem::perms::owner_read | std::filesystem::perms::owner_write);

  const std::string before = readFile(real);
  const auto big = layerOf(10000);
  Error error;
  {
    const testing::FileSizeLimit full(64 * 1024);
    EXPECT_TRUE(big->savePointsToURLError(real, &error));
  }
  EXPECT_EQ(error.message, std::string("Cannot write points: short read: ") + std::strerror(EFBIG));
  EXPECT_EQ(error.domain, "myDomain");
  std::filesystem::create_directory(dir / "folder.rwb");
  EXPECT_TRUE(big->savePointsToURLError(dir / "folder.rwb", &error));
  EXPECT_EQ(error.message, std::string("Cannot save file: ") + std::strerror(EISDIR));
  EXPECT_EQ(readFile(real), before);
  EXPECT_FALSE(std::filesystem::exists(dir / "missing/x.rwb"));
  EXPECT_TRUE(big->savePointsToURLError(dir / "missing/x.rwb", &error));
  EXPECT_EQ(error.message, std::string("Cannot write header: ") + std::strerror(ENOENT));
}

}  // namespace
}  // namespace cloudreel
