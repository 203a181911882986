#pragma once
// Holds back what the process writes on standard error while it lives. The
// PLY reader prints its failures there ("RPly: ...") and the core logs there,
// so a command that wants to say what failed in one line of its own runs the
// work under a capture, then either passes the held text on (success) or
// takes the reason from it (failure).
//
// It redirects file descriptor 2, so it sees C stdio and direct writes
// alike; the command line is single-threaded while one is active. When no
// temporary file can be had it captures nothing and the text goes straight
// through.

#include <cstdio>
#include <string>

namespace cloudreel::cli {

class StandardErrorCapture {
 public:
  StandardErrorCapture();
  // Restores standard error and writes the held text on it.
  ~StandardErrorCapture();
  StandardErrorCapture(const StandardErrorCapture&) = delete;
  StandardErrorCapture& operator=(const StandardErrorCapture&) = delete;

  // Restores standard error and answers the held text, which is then
  // dropped rather than written.
  std::string release();

 private:
  std::FILE* held_ = nullptr;
  int savedDescriptor_ = -1;
};

}  // namespace cloudreel::cli
