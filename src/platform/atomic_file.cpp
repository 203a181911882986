#include "platform/atomic_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>

namespace cloudreel {
namespace {

constexpr const char* kDomain = "CloudreelFile";

// Where a save to `path` must land: the file a symbolic link at `path`
// finally names (followed link by link, relative links from the link's own
// folder), so that saving through a link replaces the file it points to and
// keeps the link. A loop of links stops after 40 steps, as the system's own
// resolution does, and the save then fails at the rename.
std::filesystem::path followLinks(std::filesystem::path path) {
  for (int hop = 0; hop < 40; ++hop) {
    std::error_code ec;
    if (!std::filesystem::is_symlink(path, ec)) {
      break;
    }
    const std::filesystem::path next = std::filesystem::read_symlink(path, ec);
    if (ec) {
      break;
    }
    path = next.is_absolute() ? next : path.parent_path() / next;
  }
  return path;
}

std::filesystem::path temporaryBeside(const std::filesystem::path& target) {
  // Unique per process and per call, hidden, and in the target's folder.
  static std::atomic<unsigned> counter{0};
  std::string name = "." + target.filename().string() + ".tmp-" + std::to_string(getpid()) +
                     "-" + std::to_string(counter++);
  return target.parent_path() / name;
}

}  // namespace

AtomicFileReplacement::AtomicFileReplacement(const std::filesystem::path& target)
    : target_(followLinks(target)), temporary_(temporaryBeside(target_)) {}

AtomicFileReplacement::~AtomicFileReplacement() {
  if (!committed_) {
    std::error_code ignored;
    std::filesystem::remove(temporary_, ignored);
  }
}

bool AtomicFileReplacement::commit(Error* error) {
  // The new file takes the permissions of the one it replaces (a new file
  // keeps those it was created with, under the umask).
  struct stat existing {};
  if (::stat(target_.c_str(), &existing) == 0) {
    (void)::chmod(temporary_.c_str(), existing.st_mode & 07777);
  }
  std::error_code ec;
  std::filesystem::rename(temporary_, target_, ec);
  if (ec) {
    setError(error, kDomain, ec.value(),
             "Cannot replace " + target_.string() + ": " + ec.message());
    return false;
  }
  committed_ = true;
  return true;
}

bool writeFileAtomically(const std::filesystem::path& path, std::span<const std::uint8_t> bytes,
                         Error* error, Durability durability) {
  AtomicFileReplacement replacement(path);
  const int fd = ::open(replacement.temporaryPath().c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666);
  if (fd < 0) {
    setError(error, kDomain, errno, "Cannot write " + path.string() + ": " + std::strerror(errno));
    return false;
  }
  std::size_t written = 0;
  while (written < bytes.size()) {
    const ssize_t n = ::write(fd, bytes.data() + written, bytes.size() - written);
    if (n < 0 && errno == EINTR) {
      continue;
    }
    if (n <= 0) {
      const int code = n < 0 ? errno : EIO;
      ::close(fd);
      setError(error, kDomain, code, "Cannot write " + path.string() + ": " + std::strerror(code));
      return false;
    }
    written += static_cast<std::size_t>(n);
  }
  const bool synced = durability == Durability::Unsynced || ::fsync(fd) == 0;
  const int syncError = errno;
  const bool closed = ::close(fd) == 0;
  if (!synced || !closed) {
    const int code = !synced ? syncError : errno;
    setError(error, kDomain, code, "Cannot write " + path.string() + ": " + std::strerror(code));
    return false;
  }
  return replacement.commit(error);
}

}  // namespace cloudreel
