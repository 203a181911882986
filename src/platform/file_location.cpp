#include "platform/file_location.h"

#include <pwd.h>
#include <unistd.h>

#include <cstdlib>

namespace cloudreel {
namespace {

// "a/b/" as "a/b", keeping a lone root as it is.
std::filesystem::path withoutTrailingSeparator(const std::filesystem::path& path) {
  std::string s = path.string();
  while (s.size() > 1 && s.back() == '/') {
    s.pop_back();
  }
  return s;
}

}  // namespace

std::filesystem::path absolutePath(const std::filesystem::path& path) {
  std::error_code ignored;
  std::filesystem::path absolute = std::filesystem::absolute(path, ignored);
  if (absolute.empty()) {
    absolute = path;
  }
  return withoutTrailingSeparator(absolute.lexically_normal());
}

std::string lastPathComponent(const std::filesystem::path& path) {
  const std::filesystem::path trimmed = withoutTrailingSeparator(path);
  if (trimmed == "/") {
    return "/";
  }
  return trimmed.filename().string();
}

std::filesystem::path removingLastPathComponents(const std::filesystem::path& path, int n) {
  std::filesystem::path result = withoutTrailingSeparator(path);
  for (int i = 0; i < n; ++i) {
    if (result.empty() || result == "/") {
      break;
    }
    result = withoutTrailingSeparator(result.parent_path());
  }
  return result;
}

std::filesystem::path homeDirectory() {
  if (const char* home = std::getenv("HOME"); home != nullptr && home[0] != '\0') {
    return home;
  }
  if (const passwd* entry = getpwuid(getuid()); entry != nullptr && entry->pw_dir != nullptr) {
    return entry->pw_dir;
  }
  return "/";
}

std::filesystem::path configDirectory() {
  const char* xdg = std::getenv("XDG_CONFIG_HOME");
  if (xdg != nullptr && xdg[0] == '/') {
    return std::filesystem::path(xdg) / "cloudreel";
  }
  return homeDirectory() / ".config" / "cloudreel";
}

}  // namespace cloudreel
