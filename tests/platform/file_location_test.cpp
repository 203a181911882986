#include "platform/file_location.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <vector>

#include "platform/atomic_file.h"
#include "support/file_size_limit.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

namespace fs = std::filesystem;

TEST(FileLocation, PathComponents) {
  struct Case {
    std::string path;
    std::string last;
    int remove;
    std::string removed;
  };
  const Case cases[] = {
      {"/root/bundle/bundle.out", "bundle.out", 2, "/root"},
      {"/root/bundle/", "bundle", 1, "/root"},
      {"/a", "a", 5, "/"},
      {"/", "/", 1, "/"},
      {"rel/dir/file", "file", 3, ""},
      {"", "", 1, ""},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(lastPathComponent(c.path), c.last) << c.path;
    EXPECT_EQ(removingLastPathComponents(c.path, c.remove).string(), c.removed) << c.path;
  }
  EXPECT_EQ(absolutePath("/a/./b/../c/").string(), "/a/c");
  EXPECT_TRUE(absolutePath("x/y").is_absolute());
}

TEST(FileLocation, ConfigFolderFollowsXdgOnlyWhenAbsolute) {
  const char* saved = std::getenv("XDG_CONFIG_HOME");
  const std::string savedValue = saved != nullptr ? saved : "";
  setenv("XDG_CONFIG_HOME", "/tmp/xdg", 1);
  EXPECT_EQ(configDirectory().string(), "/tmp/xdg/cloudreel");
  setenv("XDG_CONFIG_HOME", "relative", 1);
  EXPECT_EQ(configDirectory(), homeDirectory() / ".config" / "cloudreel");
  if (saved != nullptr) {
    setenv("XDG_CONFIG_HOME", savedValue.c_str(), 1);
  } else {
    unsetenv("XDG_CONFIG_HOME");
  }
}

TEST(AtomicFile, ReplacesWholeOrLeavesTheOldFileByteForByte) {
  testing::TempDir dir;
  const auto target = dir / "doc.reel";
  const std::vector<std::uint8_t> first = {1, 2, 3};
  ASSERT_TRUE(writeFileAtomically(target, first, nullptr));
  EXPECT_EQ(testing::readFile(target), "\x01\x02\x03");

  Error error;
  EXPECT_FALSE(writeFileAtomically(dir / "missing-folder" / "x", first, &error));
  EXPECT_NE(error.message.find("missing-folder"), std::string::npos);

  // A full disk: the write fails with the system's reason, the old file
  // stays as it was and no temporary is left beside it.
  const std::vector<std::uint8_t> large(64 * 1024, 7);
  {
    const testing::FileSizeLimit full(4096);
    EXPECT_FALSE(writeFileAtomically(target, large, &error));
  }
  EXPECT_NE(error.message.find(std::strerror(EFBIG)), std::string::npos) << error.message;
  EXPECT_EQ(testing::readFile(target), "\x01\x02\x03");
  EXPECT_EQ(std::distance(fs::directory_iterator(dir.path()), fs::directory_iterator()), 1);
}

TEST(AtomicFile, ReplacesTheFileALinkNamesAndKeepsItsPermissions) {
  testing::TempDir dir;
  fs::create_directories(dir / "real");
  const std::vector<std::uint8_t> bytes = {4, 5};
  testing::writeFile(dir / "real/cloud.rwb", "old");
  fs::permissions(dir / "real/cloud.rwb", fs::perms::owner_read | fs::perms::owner_write);
  // A chain of two links, the first relative to its own folder.
  fs::create_symlink("real/cloud.rwb", dir / "middle.rwb");
  fs::create_symlink(dir / "middle.rwb", dir / "link.rwb");
  fs::create_symlink("new.rwb", dir / "dangling.rwb");

  ASSERT_TRUE(writeFileAtomically(dir / "link.rwb", bytes, nullptr));
  ASSERT_TRUE(writeFileAtomically(dir / "dangling.rwb", bytes, nullptr));
  EXPECT_TRUE(fs::is_symlink(dir / "link.rwb"));
  EXPECT_TRUE(fs::is_symlink(dir / "middle.rwb"));
  EXPECT_TRUE(fs::is_symlink(dir / "dangling.rwb"));
  EXPECT_EQ(testing::readFile(dir / "real/cloud.rwb"), "\x04\x05");
  EXPECT_EQ(testing::readFile(dir / "new.rwb"), "\x04\x05");
  EXPECT_EQ(fs::status(dir / "real/cloud.rwb").permissions(),
            fs::perms::owner_read | fs::perms::owner_write);
}

}  // namespace
}  // namespace cloudreel
