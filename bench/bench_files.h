#pragma once
// The large input files the benchmarks write for themselves: where they go
// and how their text reaches the disk.

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

namespace cloudreel::bench {

// CLOUDREEL_BENCH_DIR, else the temporary folder.
inline std::filesystem::path benchFolder() {
  const char* dir = std::getenv("CLOUDREEL_BENCH_DIR");
  return dir ? std::filesystem::path(dir) : std::filesystem::temp_directory_path();
}

// Text built in memory and written out in pieces of about 16 MiB, so a file
// of gigabytes never needs its whole text at once.
class ChunkedTextFile {
 public:
  explicit ChunkedTextFile(const std::filesystem::path& path)
      : file_(std::fopen(path.c_str(), "wb")) {}
  ~ChunkedTextFile() {
    if (file_ != nullptr) {
      std::fclose(file_);
    }
  }
  ChunkedTextFile(const ChunkedTextFile&) = delete;
  ChunkedTextFile& operator=(const ChunkedTextFile&) = delete;

  bool isOpen() const { return file_ != nullptr; }
  // Where to append; call flushIfFull after each record.
  std::string& text() { return text_; }
  bool flushIfFull() { return text_.size() < (std::size_t{1} << 24) || flush(); }
  // Writes what is left and closes the file; false when any write failed.
  bool close() {
    const bool ok = flush() && std::fclose(file_) == 0;
    file_ = nullptr;
    return ok && !failed_;
  }

 private:
  bool flush() {
    if (file_ == nullptr || std::fwrite(text_.data(), 1, text_.size(), file_) != text_.size()) {
      failed_ = true;
    }
    text_.clear();
    return !failed_;
  }

  std::FILE* file_;
  std::string text_;
  bool failed_ = false;
};

}  // namespace cloudreel::bench
