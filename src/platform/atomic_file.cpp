#include "platform/atomic_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>

namespace cloudreel {
namespace {

constexpr const char* kDomain = "CloudreelFile";

std::filesystem::path temporaryBeside(const std::filesystem::path& target) {
  // Unique per process and per call, hidden, and in the target's folder.
  static std::atomic<unsigned> counter{0};
  std::string name = "." + target.filename().string() + ".tmp-" + std::to_string(getpid()) +
                     "-" + std::to_string(counter++);
  return target.parent_path() / name;
}

}  // namespace

AtomicFileReplacement::AtomicFileReplacement(std::filesystem::path target)
    : target_(std::move(target)), temporary_(temporaryBeside(target_)) {}

AtomicFileReplacement::~AtomicFileReplacement() {
  if (!committed_) {
    std::error_code ignored;
    std::filesystem::remove(temporary_, ignored);
  }
}

bool AtomicFileReplacement::commit(Error* error) {
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
  const int fd = ::open(replacement.temporaryPath().c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
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
