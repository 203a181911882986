#pragma once
// The one bitmap font for overlay text: 8 × 13 pixel cells, printable ASCII,
// drawn with glBitmap at the current raster position, which each character
// advances by 8 pixels. Glyphs are 5 pixels wide and 7 tall above the
// baseline, with 2 rows of descenders; the cell reaches 3 rows below the
// raster position and 10 above it.
//
// glBitmap draws nothing while the raster position is invalid (set outside
// the viewport with glRasterPos); glWindowPos sets it in window pixels.

#include <cstdint>
#include <span>
#include <string_view>

namespace cloudreel::gl {

class BitmapFont {
 public:
  static constexpr int kCellWidth = 8;
  static constexpr int kCellHeight = 13;
  // Rows of the cell below the baseline.
  static constexpr int kDescent = 3;
  static constexpr char kFirst = ' ';
  static constexpr char kLast = '~';

  // One byte a row, bottom row first (as glBitmap reads them), the leftmost
  // pixel in the high bit. Characters outside printable ASCII have an empty
  // glyph: they draw nothing but still advance.
  static std::span<const std::uint8_t, kCellHeight> glyph(char c);

  static void drawCharacter(char c);
  static void drawString(std::string_view text);
  // Width in pixels of the string as drawn (saturating at the largest int
  // multiple of the cell width).
  static int stringWidth(std::string_view text);
};

}  // namespace cloudreel::gl
