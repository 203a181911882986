#pragma once
// The file a fuzz target rewrites with every input, for the readers that take
// a path. It lives in /dev/shm where there is one: rewriting a file on disk
// thousands of times a second waits on the disk's write-back and would slow
// fuzzing tenfold on a busy machine. Removed when the program exits. Targets
// that lay out several files use the folder and the writer on their own.

#include <fcntl.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

namespace cloudreel::fuzz {

// Where scratch files go: /dev/shm, else the temporary folder.
inline std::filesystem::path scratchFolder() {
  std::error_code ec;
  return std::filesystem::is_directory("/dev/shm", ec) ? std::filesystem::path("/dev/shm")
                                                       : std::filesystem::temp_directory_path();
}

// Replaces the contents of the file at `path`, making it when it is not
// there; a file that cannot be written ends the run, as every later input
// would be tested against stale bytes.
inline void writeScratchFile(const std::filesystem::path& path, const std::uint8_t* data,
                             std::size_t size) {
  const int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
  std::size_t done = 0;
  while (fd >= 0 && done < size) {
    const ssize_t written = ::pwrite(fd, data + done, size - done, static_cast<off_t>(done));
    if (written <= 0) {
      break;
    }
    done += static_cast<std::size_t>(written);
  }
  if (fd < 0 || done < size || ::ftruncate(fd, static_cast<off_t>(size)) != 0 || ::close(fd) != 0) {
    std::fprintf(stderr, "cannot write the scratch file %s\n", path.c_str());
    std::abort();
  }
}

class ScratchFile {
 public:
  // `name` is the file's name without the process id that makes it unique.
  explicit ScratchFile(const std::string& name)
      : path_(scratchFolder() / (std::to_string(::getpid()) + "-" + name)) {}
  ~ScratchFile() {
    std::error_code ignored;
    std::filesystem::remove(path_, ignored);
  }
  ScratchFile(const ScratchFile&) = delete;
  ScratchFile& operator=(const ScratchFile&) = delete;

  const std::filesystem::path& path() const { return path_; }

  void write(const std::uint8_t* data, std::size_t size) const {
    writeScratchFile(path_, data, size);
  }

 private:
  std::filesystem::path path_;
};

}  // namespace cloudreel::fuzz
