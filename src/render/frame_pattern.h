#pragma once
// The file-name pattern of rendered frames, a printf-style format with
// exactly one integer conversion ("output_%04d.tiff"). Patterns come from
// users (the settings sheet, the command line), so they are checked before
// they are used: a pattern with no integer conversion, two of them, or any
// other conversion (%s, %f, %n, %*d) would format garbage or read memory
// that is not there; such a pattern is refused rather than formatted.

#include <optional>
#include <string>
#include <string_view>

#include "platform/error.h"

namespace cloudreel {

class FramePattern {
 public:
  // The renderer's own default.
  FramePattern();

  // The pattern if it holds exactly one conversion of d, i, u, x, X or o,
  // with optional flags (-+ #0), width and precision written as digits, and
  // otherwise only literal text and "%%". Answers nothing, with an error
  // naming the pattern, for anything else (an empty pattern included).
  [[nodiscard]] static std::optional<FramePattern> parse(std::string_view pattern,
                                                         Error* error = nullptr);

  const std::string& text() const { return text_; }
  // The pattern with the frame number in place of its conversion, as printf
  // would write it.
  std::string format(int frame) const;

  friend bool operator==(const FramePattern&, const FramePattern&) = default;

 private:
  explicit FramePattern(std::string text) : text_(std::move(text)) {}

  std::string text_;
  // The conversion reads an unsigned int (u, x, X, o).
  bool unsigned_ = false;
};

}  // namespace cloudreel
