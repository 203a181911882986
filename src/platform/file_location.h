#pragma once
// Helpers on file locations, which the model stores as absolute paths (a
// linked point file, a photograph, a rendered frame).

#include <filesystem>
#include <string>

namespace cloudreel {

// The path made absolute against the current folder and lexically
// normalised ("a/./b/../c" becomes "a/c"); the file need not exist.
std::filesystem::path absolutePath(const std::filesystem::path& path);

// The last component, ignoring trailing separators: "/a/b/" gives "b", "/"
// gives "/", and an empty path gives "".
std::string lastPathComponent(const std::filesystem::path& path);

// The path with its last n components removed (trailing separators ignored).
// Removing more components than there are leaves the root of an absolute
// path ("/") or an empty relative path.
std::filesystem::path removingLastPathComponents(const std::filesystem::path& path, int n);

// The user's home folder: $HOME, else the password database's entry.
std::filesystem::path homeDirectory();

// Where this application keeps its settings: $XDG_CONFIG_HOME/cloudreel, or
// ~/.config/cloudreel when that is unset or not absolute.
std::filesystem::path configDirectory();

}  // namespace cloudreel
