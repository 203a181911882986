#include "render/gl/bitmap_font.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <set>
#include <vector>

#include "support/pixel_harness.h"

namespace cloudreel::gl {
namespace {

using testing::Box;
using testing::Frame;

using BitmapFontTest = testing::PixelTest;

// Every byte value: what lies outside printable ASCII is blank, as is the
// space, and every other character has a glyph of its own.
TEST(BitmapFont, EveryPrintableCharacterButSpaceHasItsOwnVisibleGlyph) {
  std::set<std::vector<std::uint8_t>> seen;
  for (int i = 0; i < 256; ++i) {
    const char c = static_cast<char>(i);
    const auto rows = BitmapFont::glyph(c);
    const std::vector<std::uint8_t> bits(rows.begin(), rows.end());
    const bool blank = std::all_of(bits.begin(), bits.end(), [](std::uint8_t b) { return b == 0; });
    const bool visible = c > BitmapFont::kFirst && c <= BitmapFont::kLast;
    EXPECT_EQ(blank, !visible) << i;
    EXPECT_TRUE(!visible || seen.insert(bits).second) << "'" << c << "' looks like another";
    // Nothing in the first column or the last two: characters stay apart.
    for (std::uint8_t row : bits) {
      EXPECT_EQ(row & 0x83, 0) << i;
    }
  }
  EXPECT_EQ(BitmapFont::stringWidth("abc\n"), 32);
}

TEST_F(BitmapFontTest, TextDrawsInsideItsCellsFromTheRasterPosition) {
  const std::string text = "Hg|8_";
  const int x0 = 10;
  const int baseline = 20;  // window pixels from the bottom
  const Frame frame = render(80, 40, [&] {
    glColor3ub(255, 255, 255);
    glWindowPos2i(x0, baseline);
    BitmapFont::drawString(text);
  });
  // In frame rows (y down) the cells span from 10 rows above the baseline
  // to 3 below it.
  const int top = 40 - (baseline + BitmapFont::kCellHeight - BitmapFont::kDescent);
  const Box cells{x0, top, x0 + BitmapFont::stringWidth(text), top + BitmapFont::kCellHeight};
  const int drawn = frame.countDrawn();
  EXPECT_GT(drawn, 40);
  EXPECT_EQ(frame.countDrawn(testing::kBlack, 0, cells), drawn) << "every pixel inside the cells";
  for (std::size_t i = 0; i < text.size(); ++i) {
    const int left = x0 + static_cast<int>(i) * BitmapFont::kCellWidth;
    const Box cell{left, cells.top, left + BitmapFont::kCellWidth, cells.bottom};
    EXPECT_GT(frame.countDrawn(testing::kBlack, 0, cell), 4) << "'" << text[i] << "'";
  }
  // 'g' reaches below the baseline, 'H' does not.
  const Box belowBaseline{x0, 40 - baseline, x0 + 16, cells.bottom};
  EXPECT_EQ(frame.countDrawn(testing::kBlack, 0,
                             Box{x0, belowBaseline.top, x0 + 8, belowBaseline.bottom}),
            0);
  EXPECT_GT(frame.countDrawn(testing::kBlack, 0,
                             Box{x0 + 8, belowBaseline.top, x0 + 16, belowBaseline.bottom}),
            0);
}

TEST_F(BitmapFontTest, EachCharacterAdvancesTheRasterPositionByOneCell) {
  const Frame frame = render(64, 32, [] {
    glColor3ub(255, 255, 255);
    glWindowPos2i(4, 10);
    BitmapFont::drawCharacter('I');
    BitmapFont::drawCharacter('\n');  // blank but advancing
    BitmapFont::drawCharacter('I');
  });
  const Frame expected = render(64, 32, [] {
    glColor3ub(255, 255, 255);
    glWindowPos2i(4, 10);
    BitmapFont::drawString("I I");
  });
  EXPECT_EQ(frame.image().pixels, expected.image().pixels);
  // The second 'I' is the first moved by two cells.
  EXPECT_EQ(frame.countDrawn(testing::kBlack, 0, Box{4, 0, 12, 32}),
            frame.countDrawn(testing::kBlack, 0, Box{20, 0, 28, 32}));
  EXPECT_EQ(frame.countDrawn(testing::kBlack, 0, Box{12, 0, 20, 32}), 0);
}

}  // namespace
}  // namespace cloudreel::gl
