#include "platform/file_location.h"

#include <gtest/gtest.h>

#include "platform/atomic_file.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

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

TEST(AtomicFile, ReplacesWholeOrLeavesTheOldFile) {
  testing::TempDir dir;
  const auto target = dir / "doc.reel";
  const std::uint8_t first[] = {1, 2, 3};
  ASSERT_TRUE(writeFileAtomically(target, first, nullptr));
  EXPECT_EQ(std::filesystem::file_size(target), 3u);
  // An abandoned replacement, which leaves the old file and no temporary
  // behind, is seen through a refused archive.

  Error error;
  EXPECT_FALSE(writeFileAtomically(dir / "missing-folder" / "x", first, &error));
  EXPECT_NE(error.message.find("missing-folder"), std::string::npos);
}

}  // namespace
}  // namespace cloudreel
