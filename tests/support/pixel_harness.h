#pragma once
// Rendering tests with real pixels: a headless context per test, frames
// drawn into an off-screen framebuffer of a given size and read back, and
// queries to assert colours, coverage and positions.
//
// In CI (CI=true) a test that cannot get a context fails; elsewhere it is
// skipped with the reason, so a developer without EGL can still run the rest.
//
// Frame coordinates are those of image files: x to the right, y down from
// the top row.

#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>

#include "render/gl/egl_context.h"
#include "render/gl/image.h"

namespace cloudreel::testing {

struct Rgba {
  std::uint8_t r = 0, g = 0, b = 0, a = 255;
  friend bool operator==(const Rgba&, const Rgba&) = default;
};

inline constexpr Rgba kBlack{0, 0, 0, 255};
inline constexpr Rgba kWhite{255, 255, 255, 255};
inline constexpr Rgba kRed{255, 0, 0, 255};

void PrintTo(const Rgba& colour, std::ostream* out);

// A rectangle of pixels, right and bottom exclusive.
struct Box {
  int left = 0, top = 0, right = 0, bottom = 0;
  int width() const { return right - left; }
  int height() const { return bottom - top; }
  bool contains(int x, int y) const { return x >= left && x < right && y >= top && y < bottom; }
  friend bool operator==(const Box&, const Box&) = default;
};

void PrintTo(const Box& box, std::ostream* out);

class Frame {
 public:
  // `depth` may be empty (a frame read without depth).
  explicit Frame(gl::RgbaImage image, gl::DepthImage depth = {});

  int width() const { return image_.width; }
  int height() const { return image_.height; }
  const gl::RgbaImage& image() const { return image_; }

  Rgba at(int x, int y) const;
  // Window depth at a pixel, 0 at the near plane and 1 at the far one.
  double depthAt(int x, int y) const;
  // Pixels inside `region` for which `test` holds.
  int count(const std::function<bool(Rgba)>& test, std::optional<Box> region = {}) const;
  // Pixels within `tolerance` of `colour` in every channel.
  int count(Rgba colour, int tolerance = 0, std::optional<Box> region = {}) const;
  // Pixels that differ from `background` by more than `tolerance`.
  int countDrawn(Rgba background = kBlack, int tolerance = 0, std::optional<Box> region = {}) const;
  // The smallest box holding every pixel that differs from `background`;
  // nothing if no pixel does.
  std::optional<Box> drawnBounds(Rgba background = kBlack, int tolerance = 0) const;
  // The smallest box holding every pixel of exactly `colour`.
  std::optional<Box> boundsOf(Rgba colour) const;
  // Mean of (r + g + b) / 3 over the pixels in `region` that differ from
  // `background`; 0 if none do.
  double meanDrawnBrightness(Box region, Rgba background = kBlack) const;

 private:
  std::optional<Box> bounds(const std::function<bool(Rgba)>& test) const;

  gl::RgbaImage image_;
  gl::DepthImage depth_;
};

::testing::AssertionResult pixelIs(const Frame& frame, int x, int y, Rgba expected,
                                   int tolerance = 0);
// Whether something was drawn, its bounds within `tolerance` of the left,
// top, right and bottom `expected`.
::testing::AssertionResult boundsNear(const std::optional<Box>& bounds,
                                      const std::array<double, 4>& expected, double tolerance);

// Draws into a fresh width × height framebuffer in the context current on
// this thread and reads back colour and depth. Before `draw` runs the frame
// is cleared to black and the far plane, the depth test is on, the viewport
// covers the frame and the projection is orthographic with one unit a pixel,
// the origin at the frame's centre, +x right, +y up, z visible from -1000 to
// 1000; the modelview matrix is the identity. All GL state `draw` changes is
// put back afterwards. A failure to make the framebuffer, a GL error left by
// `draw`, or a failed read-back is a test failure (and an empty frame).
Frame renderFrame(int width, int height, const std::function<void()>& draw);

// True where rendering tests must run (CI=true).
bool renderingRequired();

// A fixture with a fresh headless context, current on the test's thread for
// the whole test.
class PixelTest : public ::testing::Test {
 protected:
  void SetUp() override;
  void TearDown() override;

  gl::EglContext& context() { return *context_; }
  Frame render(int width, int height, const std::function<void()>& draw) {
    return renderFrame(width, height, draw);
  }

 private:
  std::unique_ptr<gl::EglContext> context_;
};

}  // namespace cloudreel::testing
