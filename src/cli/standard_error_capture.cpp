#include "cli/standard_error_capture.h"

#include <unistd.h>

namespace cloudreel::cli {

StandardErrorCapture::StandardErrorCapture() {
  std::fflush(stderr);
  held_ = std::tmpfile();
  if (held_ == nullptr) {
    return;
  }
  savedDescriptor_ = ::dup(STDERR_FILENO);
  if (savedDescriptor_ < 0 || ::dup2(::fileno(held_), STDERR_FILENO) < 0) {
    if (savedDescriptor_ >= 0) {
      ::close(savedDescriptor_);
      savedDescriptor_ = -1;
    }
    std::fclose(held_);
    held_ = nullptr;
  }
}

StandardErrorCapture::~StandardErrorCapture() {
  const std::string text = release();
  std::fwrite(text.data(), 1, text.size(), stderr);
  std::fflush(stderr);
}

std::string StandardErrorCapture::release() {
  if (held_ == nullptr) {
    return {};
  }
  std::fflush(stderr);
  ::dup2(savedDescriptor_, STDERR_FILENO);
  ::close(savedDescriptor_);
  savedDescriptor_ = -1;

  std::string text;
  std::rewind(held_);
  char buffer[4096];
  std::size_t n = 0;
  while ((n = std::fread(buffer, 1, sizeof buffer, held_)) > 0) {
    text.append(buffer, n);
  }
  std::fclose(held_);
  held_ = nullptr;
  return text;
}

}  // namespace cloudreel::cli
