#include "platform/user_defaults.h"

#include <gtest/gtest.h>

#include "platform/application_defaults.h"
#include "platform/file_location.h"
#include "platform/log.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

TEST(UserDefaults, UserValuesWinOverRegisteredOnesAndNumbersConvert) {
  UserDefaults defaults(std::make_unique<MemoryDefaultsStore>());
  defaults.registerDefaults({{"size", 1.5}, {"flag", true}, {"name", std::string("a")}});
  EXPECT_FLOAT_EQ(defaults.floatForKey("size"), 1.5f);
  EXPECT_EQ(defaults.integerForKey("size"), 1);
  EXPECT_TRUE(defaults.boolForKey("flag"));

  defaults.setObjectForKey(std::int64_t{4}, "size");
  EXPECT_DOUBLE_EQ(defaults.doubleForKey("size"), 4.0);
  defaults.removeObjectForKey("size");
  EXPECT_FLOAT_EQ(defaults.floatForKey("size"), 1.5f);  // the registered value shows again

  // Missing keys and other kinds read as zero values.
  EXPECT_EQ(defaults.integerForKey("missing"), 0);
  EXPECT_FALSE(defaults.boolForKey("name"));
  EXPECT_EQ(defaults.stringForKey("size"), "");
  EXPECT_TRUE(defaults.dataForKey("name").empty());
}

TEST(UserDefaults, ApplicationColoursAreArchivesThatAUsersPickOverrides) {
  UserDefaults defaults(std::make_unique<MemoryDefaultsStore>());
  registerApplicationDefaults(defaults);
  for (std::string_view key : {kGridColorKey, kPointColorKey, kBackgroundColorKey, kFrustumColorKey,
                               kSelectedFrustumColorKey}) {
    const auto colour = colorForDefaultsKey(defaults, key);
    ASSERT_NE(colour, nullptr) << key;
    EXPECT_EQ(colour->alpha(), 1.0f) << key;
  }
  // The folders lie in the user's home.
  EXPECT_EQ(defaults.stringForKey(kImageSavePathKey), homeDirectory().string() + "/rw_images");
  EXPECT_EQ(defaults.stringForKey(kPointCachePathKey), homeDirectory().string() + "/rw_points");

  // A colour the user picked wins, and the registration stays underneath.
  setColorForDefaultsKey(defaults, *Color::colorWithRGBA(0.25f, 0.5f, 0.75f, 0.5f), kGridColorKey);
  EXPECT_EQ(colorForDefaultsKey(defaults, kGridColorKey)->alpha(), 0.5f);
  registerApplicationDefaults(defaults);
  EXPECT_EQ(colorForDefaultsKey(defaults, kGridColorKey)->blue(), 0.75f);
}

TEST(UserDefaults, FileStoreKeepsEveryKindAcrossSessions) {
  testing::TempDir dir;
  const auto path = dir / "config" / "defaults.cbor";
  {
    UserDefaults defaults(std::make_unique<FileDefaultsStore>(path));
    defaults.setObjectForKey(true, "b");
    defaults.setObjectForKey(std::int64_t{-7}, "i");
    defaults.setObjectForKey(0.1, "d");
    defaults.setObjectForKey(std::string("/data/frames"), "s");
    defaults.setObjectForKey(Bytes{0, 255, 7}, "x");
  }
  UserDefaults reopened(std::make_unique<FileDefaultsStore>(path));
  EXPECT_TRUE(reopened.boolForKey("b"));
  EXPECT_EQ(reopened.integerForKey("i"), -7);
  EXPECT_EQ(reopened.doubleForKey("d"), 0.1);
  EXPECT_EQ(reopened.stringForKey("s"), "/data/frames");
  EXPECT_EQ(reopened.dataForKey("x"), (Bytes{0, 255, 7}));
}

TEST(UserDefaults, ACorruptStoreIsLoggedAndTheRegisteredValuesApply) {
  testing::TempDir dir;
  CapturedLog log;
  UserDefaults defaults(std::make_unique<FileDefaultsStore>(
      testing::writeFile(dir / "defaults.cbor", "not an archive at all")));
  defaults.registerDefaults({{"KTPointSize", 1.0}});
  EXPECT_FLOAT_EQ(defaults.floatForKey("KTPointSize"), 1.0f);
  EXPECT_EQ(log.count("user defaults could not be read"), 1);
}

}  // namespace
}  // namespace cloudreel
