#pragma once
// A full disk, for real: while one of these lives, no file of this process
// can grow past `bytes`, and a write beyond that fails with EFBIG ("File too
// large") instead of raising SIGXFSZ, exactly as a write to a full disk
// fails with ENOSPC. The previous limit and signal disposition come back
// when it goes.

#include <signal.h>
#include <sys/resource.h>

#include <cstdint>

namespace cloudreel::testing {

class FileSizeLimit {
 public:
  explicit FileSizeLimit(std::uint64_t bytes) {
    getrlimit(RLIMIT_FSIZE, &previous_);
    previousHandler_ = signal(SIGXFSZ, SIG_IGN);
    rlimit limited = previous_;
    limited.rlim_cur = static_cast<rlim_t>(bytes);
    setrlimit(RLIMIT_FSIZE, &limited);
  }
  ~FileSizeLimit() {
    setrlimit(RLIMIT_FSIZE, &previous_);
    signal(SIGXFSZ, previousHandler_);
  }
  FileSizeLimit(const FileSizeLimit&) = delete;
  FileSizeLimit& operator=(const FileSizeLimit&) = delete;

 private:
  rlimit previous_{};
  sighandler_t previousHandler_ = SIG_DFL;
};

}  // namespace cloudreel::testing
