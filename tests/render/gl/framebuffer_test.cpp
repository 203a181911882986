#include "render/gl/framebuffer.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include "render/gl/gl_error.h"
#include "support/pixel_harness.h"

namespace cloudreel::gl {
namespace {

using FramebufferTest = testing::PixelTest;

// One unit a window pixel, y up.
void windowPixels(int width, int height) {
  glMatrixMode(GL_PROJECTION);
  glLoadIdentity();
  glOrtho(0, width, 0, height, -1, 1);
  glMatrixMode(GL_MODELVIEW);
  glLoadIdentity();
}

TEST(FlipRows, SwapsRowIWithRowHMinus1MinusI) {
  const struct {
    std::size_t height;
    std::vector<std::uint8_t> rows;  // one byte a row
    std::vector<std::uint8_t> flipped;
  } cases[] = {
      {0, {}, {}},
      {1, {7}, {7}},
      {2, {1, 2}, {2, 1}},
      {3, {1, 2, 3}, {3, 2, 1}},  // the middle row stays
      {4, {1, 2, 3, 4}, {4, 3, 2, 1}},
  };
  for (const auto& c : cases) {
    std::vector<std::uint8_t> pixels = c.rows;
    flipRows(pixels, 1, c.height);
    EXPECT_EQ(pixels, c.flipped) << "height " << c.height;
  }
  // Whole rows move, in the sixteen-bit overload too.
  std::vector<std::uint16_t> values = {1, 2, 3, 4, 5, 6, 7, 8, 9};  // 3 rows of 3
  flipRows(values, 3, 3);
  EXPECT_EQ(values, (std::vector<std::uint16_t>{7, 8, 9, 4, 5, 6, 1, 2, 3}));
#ifdef NDEBUG
  // Too short for 4 rows of 3: a caller's bug, answered by doing nothing.
  flipRows(values, 3, 4);
  EXPECT_EQ(values, (std::vector<std::uint16_t>{7, 8, 9, 4, 5, 6, 1, 2, 3}));
#endif
}

TEST_F(FramebufferTest, RefusesBadSizesAndAMissingContextWithAnError) {
  GLint maxSize = 0;
  glGetIntegerv(GL_MAX_RENDERBUFFER_SIZE, &maxSize);
  const int big = std::numeric_limits<int>::max();
  const std::pair<int, int> sizes[] = {{0, 0},   {0, 16},           {16, 0},           {-1, 16},
                                       {16, -5}, {maxSize + 1, 16}, {16, maxSize + 1}, {big, big}};
  for (const auto& [width, height] : sizes) {
    Error error;
    EXPECT_FALSE(Framebuffer::create(width, height, &error)) << width << "×" << height;
    EXPECT_EQ(error.domain, kGLErrorDomain);
    EXPECT_EQ(error.code, static_cast<int>(GLErrorCode::InvalidSize)) << error.message;
  }
  context().doneCurrent();
  Error error;
  EXPECT_FALSE(Framebuffer::create(8, 8, &error));
  EXPECT_EQ(error.code, static_cast<int>(GLErrorCode::NoCurrentContext));
}

// A frame whose four quadrants have different colours, at an odd width so
// that rows are not multiples of four bytes.
TEST_F(FramebufferTest, ReadsColourTopRowFirstThroughCoreAndExtEntryPoints) {
  for (FramebufferApi api : {FramebufferApi::Core, FramebufferApi::Ext}) {
    Error error;
    auto framebuffer = Framebuffer::create(7, 5, &error, api);
    ASSERT_TRUE(framebuffer) << error.message;
    EXPECT_EQ(framebuffer->api(), api);
    EXPECT_GE(framebuffer->depthBits(), 24);
    {
      const FramebufferBinding binding(*framebuffer);
      windowPixels(7, 5);
      glClearColor(0, 0, 0, 1);
      glClear(GL_COLOR_BUFFER_BIT);
      glColor4ub(10, 20, 30, 40);
      glRecti(0, 0, 7, 1);  // GL's bottom row
      glColor4ub(200, 100, 50, 255);
      glRecti(0, 4, 3, 5);  // the left part of GL's top row
    }
    RgbaImage image;
    ASSERT_TRUE(framebuffer->readColor(image, &error)) << error.message;
    const testing::Frame frame(std::move(image));
    ASSERT_EQ(frame.width(), 7);
    ASSERT_EQ(frame.height(), 5);
    for (int x = 0; x < 7; ++x) {
      EXPECT_TRUE(testing::pixelIs(frame, x, 0,
                                   x < 3 ? testing::Rgba{200, 100, 50, 255} : testing::kBlack));
      EXPECT_TRUE(testing::pixelIs(frame, x, 4, {10, 20, 30, 40}));
    }
    EXPECT_EQ(frame.countDrawn(), 3 + 7);
  }
}

TEST_F(FramebufferTest, ReadsDepthAsSixteenBitValuesTopRowFirst) {
  Error error;
  auto framebuffer = Framebuffer::create(6, 4, &error);
  ASSERT_TRUE(framebuffer) << error.message;
  {
    const FramebufferBinding binding(*framebuffer);
    windowPixels(6, 4);
    glEnable(GL_DEPTH_TEST);
    glDepthFunc(GL_ALWAYS);
    glClearDepth(1.0);
    glClear(GL_DEPTH_BUFFER_BIT);
    // Eye z 0 lies halfway between the planes at -1 and 1: depth 0.5.
    glRectd(0, 3, 6, 4);
    glDisable(GL_DEPTH_TEST);
  }
  DepthImage depth;
  ASSERT_TRUE(framebuffer->readDepth(depth, &error)) << error.message;
  ASSERT_EQ(depth.width, 6);
  ASSERT_EQ(depth.height, 4);
  ASSERT_TRUE(depth.isConsistent());
  for (int x = 0; x < 6; ++x) {
    EXPECT_NEAR(depth.values[static_cast<std::size_t>(x)], 32768, 2) << "top row, x " << x;
    for (int y = 1; y < 4; ++y) {
      EXPECT_EQ(depth.values[static_cast<std::size_t>(y * 6 + x)], 65535) << x << ", " << y;
    }
  }
}

TEST_F(FramebufferTest, LeavesTheCallersBindingsAndPixelStoreAsTheyWere) {
  Error error;
  auto outer = Framebuffer::create(4, 4, &error);
  auto inner = Framebuffer::create(2, 2, &error);
  ASSERT_TRUE(outer && inner) << error.message;
  glPixelStorei(GL_PACK_ALIGNMENT, 8);
  const FramebufferBinding binding(*outer);
  GLint before = 0;
  glGetIntegerv(GL_DRAW_FRAMEBUFFER_BINDING, &before);
  RgbaImage image;
  ASSERT_TRUE(inner->readColor(image, &error)) << error.message;
  GLint after = 0;
  GLint alignment = 0;
  GLint viewport[4] = {};
  glGetIntegerv(GL_DRAW_FRAMEBUFFER_BINDING, &after);
  glGetIntegerv(GL_PACK_ALIGNMENT, &alignment);
  glGetIntegerv(GL_VIEWPORT, viewport);
  EXPECT_EQ(after, before);
  EXPECT_EQ(alignment, 8);
  EXPECT_EQ(viewport[2], 4);
  EXPECT_EQ(viewport[3], 4);
}

}  // namespace
}  // namespace cloudreel::gl
