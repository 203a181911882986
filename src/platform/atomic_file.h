#pragma once
// Replacing a user's file without ever leaving it half written: write a
// temporary file beside it (same folder, so the rename cannot cross file
// systems), then rename it over the target. A failed or abandoned write
// leaves the old file as it was and removes the temporary.
//
// A target that is a symbolic link is followed: the file it names is
// replaced and the link stays a link. The replacement keeps the permission
// bits of the file it replaces.

#include <cstdint>
#include <filesystem>
#include <span>

#include "platform/error.h"

namespace cloudreel {

class AtomicFileReplacement {
 public:
  explicit AtomicFileReplacement(const std::filesystem::path& target);
  // Removes the temporary file unless committed.
  ~AtomicFileReplacement();
  AtomicFileReplacement(const AtomicFileReplacement&) = delete;
  AtomicFileReplacement& operator=(const AtomicFileReplacement&) = delete;

  // The file that is replaced: the given path with its links followed.
  const std::filesystem::path& target() const { return target_; }
  // Where the writer puts the new contents (for writers that take a path).
  const std::filesystem::path& temporaryPath() const { return temporary_; }
  // Renames the finished temporary over the target.
  [[nodiscard]] bool commit(Error* error);

 private:
  std::filesystem::path target_;
  std::filesystem::path temporary_;
  bool committed_ = false;
};

enum class Durability {
  // Flushed to the disk before the rename: documents and settings, which a
  // crash must not lose.
  Synced,
  // Renamed as soon as written: rendered frames, which are cheap to redo and
  // where a flush per frame would cost more than the frame itself.
  Unsynced,
};

// Writes the bytes to the path atomically.
[[nodiscard]] bool writeFileAtomically(const std::filesystem::path& path,
                                       std::span<const std::uint8_t> bytes, Error* error,
                                       Durability durability = Durability::Synced);

}  // namespace cloudreel
