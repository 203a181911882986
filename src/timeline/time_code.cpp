#include "timeline/time_code.h"

#include <fmt/printf.h>

#include <cstdint>

namespace cloudreel {

std::string TimeCode::timeCodeForFrame(int frame, int fps) {
  if (fps == 0) {
    return "00:00:00:00";
  }
  // In 64 bits, where INT_MIN / -1 cannot overflow; every field then fits
  // an int again.
  const std::int64_t s = std::int64_t{frame} / fps;
  const auto ff = static_cast<int>(std::int64_t{frame} % fps);
  const auto hh = static_cast<int>((s / 3600) % 99);
  const auto mm = static_cast<int>((s / 60) % 60);
  const auto ss = static_cast<int>(s % 60);
  return fps < 100 ? fmt::sprintf("%02d:%02d:%02d:%02d", hh, mm, ss, ff)
                   : fmt::sprintf("%02d:%02d:%02d:%03d", hh, mm, ss, ff);
}

}  // namespace cloudreel
