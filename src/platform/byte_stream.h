#pragma once
// Byte streams the keyed archive writes to and reads from, in memory and on
// disk. The file streams buffer small transfers, but a transfer at least as
// large as their buffer goes straight between the caller's memory and the
// file, so a gigabyte of point data is never copied through a buffer.

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <span>
#include <vector>

#include "platform/error.h"

namespace cloudreel {

using Bytes = std::vector<std::uint8_t>;

class OutputStream {
 public:
  virtual ~OutputStream();
  // Writes all of the bytes or answers NO.
  virtual bool write(const void* data, std::size_t size) = 0;
};

// A stream that can be read in any order: the unarchiver parses the structure
// first and comes back for large byte strings when they are asked for.
class InputStream {
 public:
  virtual ~InputStream();
  // Reads exactly `size` bytes from the current position; answers NO when
  // fewer remain or reading failed, and the position is then not to be relied on.
  virtual bool read(void* data, std::size_t size) = 0;
  // Positions are byte offsets from the start; seeking past the end answers NO.
  virtual bool seek(std::uint64_t position) = 0;
  virtual std::uint64_t position() const = 0;
  virtual std::uint64_t size() const = 0;

  std::uint64_t remaining() const { return size() - position(); }
};

// Appends to a byte vector it owns.
class MemoryOutputStream final : public OutputStream {
 public:
  bool write(const void* data, std::size_t size) override;
  const Bytes& bytes() const { return bytes_; }
  Bytes takeBytes() { return std::move(bytes_); }

 private:
  Bytes bytes_;
};

// Reads bytes owned by someone else, who keeps them alive while it reads.
class MemoryInputStream final : public InputStream {
 public:
  explicit MemoryInputStream(std::span<const std::uint8_t> data) : data_(data) {}
  bool read(void* data, std::size_t size) override;
  bool seek(std::uint64_t position) override;
  std::uint64_t position() const override { return position_; }
  std::uint64_t size() const override { return data_.size(); }

 private:
  std::span<const std::uint8_t> data_;
  std::uint64_t position_ = 0;
};

class FileOutputStream final : public OutputStream {
 public:
  // Creates or truncates the file.
  static std::unique_ptr<FileOutputStream> create(const std::filesystem::path& path, Error* error);
  // Closes without reporting: call close() to learn whether the data landed.
  ~FileOutputStream() override;
  FileOutputStream(const FileOutputStream&) = delete;
  FileOutputStream& operator=(const FileOutputStream&) = delete;

  bool write(const void* data, std::size_t size) override;
  [[nodiscard]] bool flush();
  // Flushes and asks the system to put the data on the disk.
  [[nodiscard]] bool sync();
  [[nodiscard]] bool close();
  // Why the last operation failed, naming the file.
  const Error& error() const { return error_; }

 private:
  FileOutputStream(int descriptor, std::filesystem::path path);
  bool writeThrough(const std::uint8_t* data, std::size_t size);
  bool fail(const char* what);

  int descriptor_;
  std::filesystem::path path_;
  std::vector<std::uint8_t> buffer_;
  std::size_t used_ = 0;
  bool failed_ = false;
  Error error_;
};

class FileInputStream final : public InputStream {
 public:
  static std::unique_ptr<FileInputStream> open(const std::filesystem::path& path, Error* error);
  ~FileInputStream() override;
  FileInputStream(const FileInputStream&) = delete;
  FileInputStream& operator=(const FileInputStream&) = delete;

  bool read(void* data, std::size_t size) override;
  bool seek(std::uint64_t position) override;
  std::uint64_t position() const override { return position_; }
  std::uint64_t size() const override { return size_; }

 private:
  FileInputStream(int descriptor, std::uint64_t size);
  bool readAt(std::uint64_t offset, std::uint8_t* data, std::size_t size);

  int descriptor_;
  std::uint64_t size_;
  std::uint64_t position_ = 0;
  // The buffer holds the file's bytes [bufferStart_, bufferStart_ + bufferLength_).
  std::vector<std::uint8_t> buffer_;
  std::uint64_t bufferStart_ = 0;
  std::size_t bufferLength_ = 0;
};

}  // namespace cloudreel
