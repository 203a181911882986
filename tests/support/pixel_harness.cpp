#include "pixel_harness.h"

#include <epoxy/gl.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <ostream>
#include <string_view>

#include "render/gl/framebuffer.h"

namespace cloudreel::testing {

void PrintTo(const Rgba& colour, std::ostream* out) {
  *out << "rgba(" << int{colour.r} << ", " << int{colour.g} << ", " << int{colour.b} << ", "
       << int{colour.a} << ")";
}

void PrintTo(const Box& box, std::ostream* out) {
  *out << "box(x " << box.left << ".." << box.right << ", y " << box.top << ".." << box.bottom
       << ")";
}

namespace {

bool near(Rgba a, Rgba b, int tolerance) {
  return std::abs(a.r - b.r) <= tolerance && std::abs(a.g - b.g) <= tolerance &&
         std::abs(a.b - b.b) <= tolerance && std::abs(a.a - b.a) <= tolerance;
}

}  // namespace

Frame::Frame(gl::RgbaImage image, gl::DepthImage depth)
    : image_(std::move(image)), depth_(std::move(depth)) {
  if (!image_.isConsistent()) {
    image_ = gl::RgbaImage{};
  }
  if (!depth_.isConsistent() || depth_.width != image_.width || depth_.height != image_.height) {
    depth_ = gl::DepthImage{};
  }
}

Rgba Frame::at(int x, int y) const {
  if (x < 0 || y < 0 || x >= width() || y >= height()) {
    ADD_FAILURE() << "pixel (" << x << ", " << y << ") is outside the " << width() << "×"
                  << height() << " frame";
    return {};
  }
  const std::size_t i =
      static_cast<std::size_t>(y) * image_.rowBytes() + static_cast<std::size_t>(x) * 4;
  return {image_.pixels[i], image_.pixels[i + 1], image_.pixels[i + 2], image_.pixels[i + 3]};
}

double Frame::depthAt(int x, int y) const {
  if (x < 0 || y < 0 || x >= depth_.width || y >= depth_.height) {
    ADD_FAILURE() << "no depth at (" << x << ", " << y << ") in the " << depth_.width << "×"
                  << depth_.height << " depth frame";
    return 1.0;
  }
  return depth_.values[static_cast<std::size_t>(y) * static_cast<std::size_t>(depth_.width) +
                       static_cast<std::size_t>(x)] /
         65535.0;
}

int Frame::count(const std::function<bool(Rgba)>& test, std::optional<Box> region) const {
  const Box box = region.value_or(Box{0, 0, width(), height()});
  int n = 0;
  for (int y = std::max(box.top, 0); y < std::min(box.bottom, height()); ++y) {
    for (int x = std::max(box.left, 0); x < std::min(box.right, width()); ++x) {
      n += test(at(x, y)) ? 1 : 0;
    }
  }
  return n;
}

int Frame::count(Rgba colour, int tolerance, std::optional<Box> region) const {
  return count([&](Rgba p) { return near(p, colour, tolerance); }, region);
}

int Frame::countDrawn(Rgba background, int tolerance, std::optional<Box> region) const {
  return count([&](Rgba p) { return !near(p, background, tolerance); }, region);
}

std::optional<Box> Frame::drawnBounds(Rgba background, int tolerance) const {
  return bounds([&](Rgba p) { return !near(p, background, tolerance); });
}

std::optional<Box> Frame::boundsOf(Rgba colour) const {
  return bounds([&](Rgba p) { return p == colour; });
}

std::optional<Box> Frame::bounds(const std::function<bool(Rgba)>& test) const {
  std::optional<Box> b;
  for (int y = 0; y < height(); ++y) {
    for (int x = 0; x < width(); ++x) {
      if (test(at(x, y))) {
        b = b ? Box{std::min(b->left, x), std::min(b->top, y), std::max(b->right, x + 1),
                    std::max(b->bottom, y + 1)}
              : Box{x, y, x + 1, y + 1};
      }
    }
  }
  return b;
}

double Frame::meanDrawnBrightness(Box region, Rgba background) const {
  double sum = 0;
  int n = 0;
  count(
      [&](Rgba p) {
        if (near(p, background, 0)) {
          return false;
        }
        sum += (p.r + p.g + p.b) / 3.0;
        ++n;
        return true;
      },
      region);
  return n > 0 ? sum / n : 0.0;
}

// A pixel outside the frame fails through Frame::at.
::testing::AssertionResult pixelIs(const Frame& frame, int x, int y, Rgba expected, int tolerance) {
  const Rgba actual = frame.at(x, y);
  if (near(actual, expected, tolerance)) {
    return ::testing::AssertionSuccess();
  }
  return ::testing::AssertionFailure()
         << "pixel (" << x << ", " << y << ") is " << ::testing::PrintToString(actual)
         << ", expected " << ::testing::PrintToString(expected) << " ± " << tolerance;
}

::testing::AssertionResult boundsNear(const std::optional<Box>& bounds,
                                      const std::array<double, 4>& expected, double tolerance) {
  const auto off = [&](int side, std::size_t i) {
    return std::abs(side - expected[i]) > tolerance;
  };
  if (!bounds || off(bounds->left, 0) || off(bounds->top, 1) || off(bounds->right, 2) ||
      off(bounds->bottom, 3)) {
    return ::testing::AssertionFailure()
           << "drawn " << ::testing::PrintToString(bounds) << ", expected x " << expected[0] << ".."
           << expected[2] << ", y " << expected[1] << ".." << expected[3] << " ± " << tolerance;
  }
  return ::testing::AssertionSuccess();
}

Frame renderFrame(int width, int height, const std::function<void()>& draw) {
  Error error;
  auto framebuffer = gl::Framebuffer::create(width, height, &error);
  if (!framebuffer) {
    ADD_FAILURE() << "no " << width << "×" << height << " framebuffer: " << error.message;
    return Frame(gl::RgbaImage{});
  }
  {
    const gl::FramebufferBinding binding(*framebuffer);
    glPushAttrib(GL_ALL_ATTRIB_BITS);
    glMatrixMode(GL_PROJECTION);
    glPushMatrix();
    glLoadIdentity();
    glOrtho(-width / 2.0, width / 2.0, -height / 2.0, height / 2.0, -1000.0, 1000.0);
    glMatrixMode(GL_MODELVIEW);
    glPushMatrix();
    glLoadIdentity();
    glClearColor(0.0f, 0.0f, 0.0f, 1.0f);
    glClearDepth(1.0);
    glClear(GL_COLOR_BUFFER_BIT | GL_DEPTH_BUFFER_BIT);
    glEnable(GL_DEPTH_TEST);
    draw();
    const GLenum drawError = glGetError();
    glMatrixMode(GL_PROJECTION);
    glPopMatrix();
    glMatrixMode(GL_MODELVIEW);
    glPopMatrix();
    glPopAttrib();
    if (drawError != GL_NO_ERROR) {
      ADD_FAILURE() << "drawing left OpenGL error 0x" << std::hex << drawError;
    }
  }
  gl::RgbaImage image;
  gl::DepthImage depth;
  if (!framebuffer->readColor(image, &error) || !framebuffer->readDepth(depth, &error)) {
    ADD_FAILURE() << "reading the frame back failed: " << error.message;
  }
  return Frame(std::move(image), std::move(depth));
}

bool renderingRequired() {
  const char* ci = std::getenv("CI");
  return ci != nullptr && std::string_view(ci) == "true";
}

void PixelTest::SetUp() {
  Error error;
  context_ = gl::EglContext::createHeadless(&error);
  if (!context_) {
    if (renderingRequired()) {
      FAIL() << "CI=true requires rendering tests to run: " << error.message;
    }
    GTEST_SKIP() << "no headless OpenGL context, rendering test skipped: " << error.message;
  }
  ASSERT_TRUE(context_->makeCurrent(&error)) << error.message;
}

void PixelTest::TearDown() {
  if (context_) {
    context_->doneCurrent();
    context_.reset();
  }
}

}  // namespace cloudreel::testing
