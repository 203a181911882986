#include "render/frame_pattern.h"

#include <cstdio>
#include <string>

namespace cloudreel {
namespace {

constexpr std::string_view kDefaultPattern = "out_%04d.tiff";
constexpr std::string_view kFlags = "-+ #0";
constexpr std::string_view kIntegerConversions = "diuxXo";
// Widths and precisions beyond this are refused: nobody numbers frames with
// a thousand digits, and a huge width would make every name that long.
constexpr std::size_t kMaxDigits = 3;

bool isDigit(char c) { return c >= '0' && c <= '9'; }

// Skips a run of digits at `i`, at most kMaxDigits; false if longer.
bool skipDigits(std::string_view text, std::size_t& i) {
  const std::size_t start = i;
  while (i < text.size() && isDigit(text[i])) {
    ++i;
  }
  return i - start <= kMaxDigits;
}

}  // namespace

FramePattern::FramePattern() : text_(kDefaultPattern) {}

std::optional<FramePattern> FramePattern::parse(std::string_view pattern, Error* error) {
  const auto refuse = [&](const std::string& why) -> std::optional<FramePattern> {
    if (error != nullptr) {
      *error = Error{"Cloudreel", 100,
                     "The file name pattern \"" + std::string(pattern) + "\" " + why};
    }
    return std::nullopt;
  };
  int conversions = 0;
  bool unsignedConversion = false;
  for (std::size_t i = 0; i < pattern.size(); ++i) {
    if (pattern[i] == '\0') {
      return refuse("holds a NUL character");
    }
    if (pattern[i] != '%') {
      continue;
    }
    ++i;
    if (i < pattern.size() && pattern[i] == '%') {
      continue;
    }
    while (i < pattern.size() && kFlags.find(pattern[i]) != std::string_view::npos) {
      ++i;
    }
    bool sane = skipDigits(pattern, i);
    if (sane && i < pattern.size() && pattern[i] == '.') {
      ++i;
      sane = skipDigits(pattern, i);
    }
    if (!sane) {
      return refuse("asks for a number wider than 999 characters");
    }
    if (i >= pattern.size() || kIntegerConversions.find(pattern[i]) == std::string_view::npos) {
      return refuse("may hold only one integer conversion such as %04d, and %% for a percent sign");
    }
    ++conversions;
    unsignedConversion = pattern[i] != 'd' && pattern[i] != 'i';
  }
  if (conversions != 1) {
    return refuse("must hold exactly one integer conversion such as %04d for the frame number");
  }
  FramePattern checked{std::string(pattern)};
  checked.unsigned_ = unsignedConversion;
  return checked;
}

std::string FramePattern::format(int frame) const {
  // The pattern was checked to hold one integer conversion and nothing else
  // that reads an argument, so handing it to snprintf is safe. %u, %x and %o
  // get the number as the unsigned int they read (a negative frame wraps, as
  // printf would show it).
#if defined(__GNUC__)
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
#endif
  const auto print = [&](char* into, std::size_t size) {
    return unsigned_ ? std::snprintf(into, size, text_.c_str(), static_cast<unsigned>(frame))
                     : std::snprintf(into, size, text_.c_str(), frame);
  };
  const int length = print(nullptr, 0);
  std::string name(static_cast<std::size_t>(length > 0 ? length : 0), '\0');
  if (length > 0) {
    (void)print(name.data(), name.size() + 1);
  }
#if defined(__GNUC__)
#pragma GCC diagnostic pop
#endif
  return name;
}

}  // namespace cloudreel
