#include "platform/byte_stream.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <limits>
#include <string>

namespace cloudreel {
namespace {

// Large enough that the archive's many small heads cost few system calls,
// small enough to be noise beside the data it carries.
constexpr std::size_t kFileBufferSize = 64 * 1024;
// Linux moves at most this much in one read or write call.
constexpr std::size_t kMaxTransfer = 0x7ffff000;

std::string describeErrno(int code) { return std::strerror(code); }

}  // namespace

OutputStream::~OutputStream() = default;
InputStream::~InputStream() = default;

// ---------------------------------------------------------------------------
// Memory

bool MemoryOutputStream::write(const void* data, std::size_t size) {
  const auto* bytes = static_cast<const std::uint8_t*>(data);
  bytes_.insert(bytes_.end(), bytes, bytes + size);
  return true;
}

bool MemoryInputStream::read(void* data, std::size_t size) {
  if (size > data_.size() - position_) {
    return false;
  }
  if (size > 0) {
    std::memcpy(data, data_.data() + position_, size);
  }
  position_ += size;
  return true;
}

bool MemoryInputStream::seek(std::uint64_t position) {
  if (position > data_.size()) {
    return false;
  }
  position_ = position;
  return true;
}

// ---------------------------------------------------------------------------
// File output

std::unique_ptr<FileOutputStream> FileOutputStream::create(const std::filesystem::path& path,
                                                           Error* error) {
  int descriptor = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666);
  if (descriptor < 0) {
    setError(error, "CloudreelFile", errno,
             "cannot create " + path.string() + ": " + describeErrno(errno));
    return nullptr;
  }
  return std::unique_ptr<FileOutputStream>(new FileOutputStream(descriptor, path));
}

FileOutputStream::FileOutputStream(int descriptor, std::filesystem::path path)
    : descriptor_(descriptor), path_(std::move(path)), buffer_(kFileBufferSize) {}

FileOutputStream::~FileOutputStream() {
  if (descriptor_ >= 0) {
    (void)close();
  }
}

bool FileOutputStream::fail(const char* what) {
  int code = errno;
  failed_ = true;
  error_ = Error{"CloudreelFile", code,
                 std::string(what) + " " + path_.string() + ": " + describeErrno(code)};
  return false;
}

bool FileOutputStream::writeThrough(const std::uint8_t* data, std::size_t size) {
  while (size > 0) {
    ssize_t written = ::write(descriptor_, data, std::min(size, kMaxTransfer));
    if (written < 0) {
      if (errno == EINTR) {
        continue;
      }
      return fail("cannot write");
    }
    data += written;
    size -= static_cast<std::size_t>(written);
  }
  return true;
}

bool FileOutputStream::write(const void* data, std::size_t size) {
  if (failed_ || descriptor_ < 0) {
    return false;
  }
  if (size == 0) {
    return true;  // an empty span may carry a null pointer, which memcpy must not see
  }
  const auto* bytes = static_cast<const std::uint8_t*>(data);
  if (size <= buffer_.size() - used_) {
    std::memcpy(buffer_.data() + used_, bytes, size);
    used_ += size;
    return true;
  }
  if (!flush()) {
    return false;
  }
  if (size >= buffer_.size()) {
    return writeThrough(bytes, size);
  }
  std::memcpy(buffer_.data(), bytes, size);
  used_ = size;
  return true;
}

bool FileOutputStream::flush() {
  if (failed_ || descriptor_ < 0) {
    return false;
  }
  std::size_t pending = used_;
  used_ = 0;
  return writeThrough(buffer_.data(), pending);
}

bool FileOutputStream::sync() {
  if (!flush()) {
    return false;
  }
  if (::fsync(descriptor_) != 0) {
    return fail("cannot sync");
  }
  return true;
}

bool FileOutputStream::close() {
  if (descriptor_ < 0) {
    return !failed_;
  }
  bool flushed = flush();
  int result = ::close(descriptor_);
  descriptor_ = -1;
  if (result != 0 && !failed_) {
    return fail("cannot close");
  }
  return flushed && !failed_;
}

// ---------------------------------------------------------------------------
// File input

std::unique_ptr<FileInputStream> FileInputStream::open(const std::filesystem::path& path,
                                                       Error* error) {
  int descriptor = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (descriptor < 0) {
    setError(error, "CloudreelFile", errno,
             "cannot open " + path.string() + ": " + describeErrno(errno));
    return nullptr;
  }
  struct stat info {};
  if (::fstat(descriptor, &info) != 0 || !S_ISREG(info.st_mode)) {
    int code = errno;
    ::close(descriptor);
    setError(error, "CloudreelFile", code, "cannot read " + path.string() + ": not a regular file");
    return nullptr;
  }
  return std::unique_ptr<FileInputStream>(
      new FileInputStream(descriptor, static_cast<std::uint64_t>(info.st_size)));
}

FileInputStream::FileInputStream(int descriptor, std::uint64_t size)
    : descriptor_(descriptor), size_(size) {}

FileInputStream::~FileInputStream() { ::close(descriptor_); }

bool FileInputStream::readAt(std::uint64_t offset, std::uint8_t* data, std::size_t size) {
  while (size > 0) {
    ssize_t got = ::pread(descriptor_, data, std::min(size, kMaxTransfer),
                          static_cast<off_t>(offset));
    if (got < 0 && errno == EINTR) {
      continue;
    }
    if (got <= 0) {
      return false;  // an error, or the file shrank under us
    }
    data += got;
    size -= static_cast<std::size_t>(got);
    offset += static_cast<std::uint64_t>(got);
  }
  return true;
}

bool FileInputStream::read(void* data, std::size_t size) {
  if (size > size_ - position_) {
    return false;
  }
  if (size == 0) {
    return true;  // an empty read may carry a null pointer, which memcpy must not see
  }
  auto* out = static_cast<std::uint8_t*>(data);
  // Whatever the buffer already holds from the current position.
  if (position_ >= bufferStart_ && position_ < bufferStart_ + bufferLength_) {
    auto at = static_cast<std::size_t>(position_ - bufferStart_);
    std::size_t n = std::min(size, bufferLength_ - at);
    std::memcpy(out, buffer_.data() + at, n);
    out += n;
    size -= n;
    position_ += n;
  }
  if (size == 0) {
    return true;
  }
  if (size >= kFileBufferSize) {
    if (!readAt(position_, out, size)) {
      return false;
    }
    position_ += size;
    return true;
  }
  buffer_.resize(kFileBufferSize);
  auto fill = static_cast<std::size_t>(
      std::min<std::uint64_t>(kFileBufferSize, size_ - position_));
  if (!readAt(position_, buffer_.data(), fill)) {
    bufferLength_ = 0;
    return false;
  }
  bufferStart_ = position_;
  bufferLength_ = fill;
  std::memcpy(out, buffer_.data(), size);
  position_ += size;
  return true;
}

bool FileInputStream::seek(std::uint64_t position) {
  if (position > size_) {
    return false;
  }
  position_ = position;
  return true;
}

}  // namespace cloudreel
