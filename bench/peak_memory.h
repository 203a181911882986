#pragma once
// What a piece of work adds to the process's resident memory at its peak:
// the resident high-water mark is reset to the current resident size when
// the measurement starts, and read back when it ends.

#include <cstdlib>
#include <fstream>
#include <string>

namespace cloudreel::bench {

// A figure of /proc/self/status in bytes ("VmRSS", "VmHWM"); 0 when it
// cannot be read.
inline double statusBytes(const std::string& key) {
  std::ifstream status("/proc/self/status");
  std::string line;
  while (std::getline(status, line)) {
    if (line.starts_with(key + ":")) {
      return std::strtod(line.c_str() + key.size() + 1, nullptr) * 1024.0;
    }
  }
  return 0.0;
}

class PeakMemory {
 public:
  PeakMemory() : baseline_(statusBytes("VmRSS")) {
    std::ofstream clearRefs("/proc/self/clear_refs");
    resettable_ = static_cast<bool>(clearRefs << "5" << std::flush);
  }
  // Bytes added at the peak since construction, over `bytes`; 0 when the
  // high-water mark could not be reset.
  double over(double bytes) const {
    return resettable_ && bytes > 0 ? (statusBytes("VmHWM") - baseline_) / bytes : 0.0;
  }

 private:
  double baseline_;
  bool resettable_ = false;
};

}  // namespace cloudreel::bench
