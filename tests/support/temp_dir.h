#pragma once
// A fresh folder under the system's temporary directory, removed with
// everything in it when the object goes, and whole-file reads and writes for
// the files tests put there.

#include <filesystem>
#include <set>
#include <string>
#include <string_view>

namespace cloudreel::testing {

class TempDir {
 public:
  TempDir();
  ~TempDir();
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;

  const std::filesystem::path& path() const { return path_; }
  std::filesystem::path operator/(const std::filesystem::path& name) const { return path_ / name; }

 private:
  std::filesystem::path path_;
};

// Replaces the file at `path` (making its folder) with `bytes`; answers the
// path.
std::filesystem::path writeFile(const std::filesystem::path& path, std::string_view bytes);
// The file's bytes; empty when it cannot be read.
std::string readFile(const std::filesystem::path& path);
// The names of what a folder holds; none for a folder that is not there.
std::set<std::string> fileNamesIn(const std::filesystem::path& folder);

}  // namespace cloudreel::testing
