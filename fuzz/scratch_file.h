#pragma once
// The file a fuzz target rewrites with every input, for the readers that take
// a path. It lives in /dev/shm where there is one: rewriting a file on disk
// thousands of times a second waits on the disk's write-back and would slow
// fuzzing tenfold on a busy machine. Removed when the program exits.

#include <fcntl.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

namespace cloudreel::fuzz {

class ScratchFile {
 public:
  // `name` is the file's name without the process id that makes it unique.
  explicit ScratchFile(const std::string& name) {
    std::error_code ec;
    const std::filesystem::path folder = std::filesystem::is_directory("/dev/shm", ec)
                                             ? std::filesystem::path("/dev/shm")
                                             : std::filesystem::temp_directory_path();
    path_ = folder / (std::to_string(::getpid()) + "-" + name);
  }
  ~ScratchFile() {
    std::error_code ignored;
    std::filesystem::remove(path_, ignored);
  }
  ScratchFile(const ScratchFile&) = delete;
  ScratchFile& operator=(const ScratchFile&) = delete;

  const std::filesystem::path& path() const { return path_; }

  // Replaces the contents; a file that cannot be written ends the run, as
  // every later input would be tested against stale bytes.
  void write(const std::uint8_t* data, std::size_t size) const {
    const int fd = ::open(path_.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
    std::size_t done = 0;
    while (fd >= 0 && done < size) {
      const ssize_t written = ::pwrite(fd, data + done, size - done, static_cast<off_t>(done));
      if (written <= 0) {
        break;
      }
      done += static_cast<std::size_t>(written);
    }
    if (fd < 0 || done < size || ::ftruncate(fd, static_cast<off_t>(size)) != 0 ||
        ::close(fd) != 0) {
      std::fprintf(stderr, "cannot write the scratch file %s\n", path_.c_str());
      std::abort();
    }
  }

 private:
  std::filesystem::path path_;
};

}  // namespace cloudreel::fuzz
