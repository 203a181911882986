#include "render/gl/egl_context.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <thread>

#include "render/gl/display_list.h"
#include "render/gl/framebuffer.h"
#include "render/gl/gl_error.h"
#include "render/gl/shapes.h"
#include "support/pixel_harness.h"

namespace cloudreel::gl {
namespace {

using testing::Frame;
using testing::kRed;
using testing::PixelTest;
using testing::renderFrame;

void drawRedSquare() {
  glColor3ub(255, 0, 0);
  glRectd(-10, -10, 10, 10);
}

using EglContextTest = PixelTest;

// Mesa offers both platforms (the device platform through its software
// device), so CI checks the fallback as well as the first choice. Each is a
// compatibility context: immediate mode and the fixed-function matrices draw
// a coloured square under the harness's orthographic projection.
TEST_F(EglContextTest, BothHeadlessPlatformsGiveACompatibilityContextThatDraws) {
  for (EglPlatform platform : {EglPlatform::Device, EglPlatform::Surfaceless}) {
    Error error;
    auto only = EglContext::createHeadless(&error, platform);
    if (!only && !testing::renderingRequired()) {
      continue;  // e.g. a GPU driver without Mesa's surfaceless platform
    }
    ASSERT_TRUE(only) << error.message;
    EXPECT_EQ(only->platform(), platform);
    EXPECT_GE(only->glVersion(), 21);
    EXPECT_FALSE(only->description().empty());
    const CurrentContext current(*only, &error);
    ASSERT_TRUE(current) << error.message;
    const Frame frame = renderFrame(40, 40, drawRedSquare);
    EXPECT_EQ(frame.count(kRed), 20 * 20) << only->description();
    EXPECT_TRUE(testing::pixelIs(frame, 20, 20, kRed));
  }
}

// A framebuffer, unlike a display list, is not shared: it is read only in
// the context that made it.
TEST_F(EglContextTest, SharedContextsShareDisplayListsButNotFramebuffers) {
  DisplayList list;
  ASSERT_TRUE(list.compile(drawRedSquare));
  Error error;
  auto framebuffer = Framebuffer::create(8, 8, &error);
  ASSERT_TRUE(framebuffer) << error.message;
  std::unique_ptr<GLContext> shared = context().createSharedContext(&error);
  ASSERT_TRUE(shared) << error.message;
  std::unique_ptr<EglContext> independent = EglContext::createHeadless(&error);
  ASSERT_TRUE(independent) << error.message;
  EXPECT_TRUE(shared->sharesObjectsWith(context()));
  EXPECT_FALSE(independent->sharesObjectsWith(context()));

  {
    const CurrentContext current(*shared, &error);
    ASSERT_TRUE(current) << error.message;
    EXPECT_TRUE(list.isUsable());
    const Frame frame = renderFrame(40, 40, [&] { list.call(); });
    EXPECT_EQ(frame.count(kRed), 20 * 20);
    RgbaImage image;
    EXPECT_FALSE(framebuffer->readColor(image, &error));
    EXPECT_EQ(error.code, static_cast<int>(GLErrorCode::NoCurrentContext));
    EXPECT_TRUE(image.pixels.empty());
  }
  EXPECT_TRUE(context().isCurrent()) << "the guard puts the previous context back";
  {
    const CurrentContext current(*independent, &error);
    ASSERT_TRUE(current) << error.message;
    EXPECT_FALSE(list.isUsable());
    // Drawing through the list in another share group compiles it there.
    DisplayList other;
    const Frame frame = renderFrame(40, 40, [&] { other.callOrCompile(drawRedSquare); });
    EXPECT_EQ(frame.count(kRed), 20 * 20);
  }
}

TEST_F(EglContextTest, ASharedContextDrawsOnABackgroundThread) {
  // The list is made here and drawn there, as the off-screen renderer does
  // with the document's cached drawing.
  DisplayList sphere;
  ASSERT_TRUE(sphere.compile([] {
    glColor3ub(255, 0, 0);
    drawSolidSphere(20, 32, 16);
  }));
  Error error;
  std::unique_ptr<GLContext> shared = context().createSharedContext(&error);
  ASSERT_TRUE(shared) << error.message;

  Error threadError;
  bool madeCurrent = false;
  RgbaImage image;
  std::thread worker([&] {
    madeCurrent = shared->makeCurrent(&threadError);
    if (madeCurrent) {
      image = renderFrame(64, 64, [&] { sphere.call(); }).image();
      shared->doneCurrent();
    }
  });
  worker.join();
  ASSERT_TRUE(madeCurrent) << threadError.message;
  const Frame frame(std::move(image));
  EXPECT_GT(frame.count(kRed), 1000);
  EXPECT_TRUE(testing::pixelIs(frame, 32, 32, kRed));
}

TEST_F(EglContextTest, AContextCurrentOnOneThreadCannotBeMadeCurrentOnAnother) {
  Error error;
  bool madeCurrent = true;
  std::thread other([&] { madeCurrent = context().makeCurrent(&error); });
  other.join();
  EXPECT_FALSE(madeCurrent);
  EXPECT_EQ(error.domain, kGLErrorDomain);
  EXPECT_EQ(error.code, static_cast<int>(GLErrorCode::MakeCurrentFailed));
  EXPECT_TRUE(context().isCurrent());
}

TEST_F(EglContextTest, ANameReleasedWithoutItsContextCurrentIsDeletedWhenTheContextReturns) {
  GLuint name = 0;
  {
    DisplayList list;
    ASSERT_TRUE(list.compile(drawRedSquare));
    name = list.name();
    context().doneCurrent();
  }
  EXPECT_EQ(context().shareGroup()->pendingCount(), 1u);
  ASSERT_TRUE(context().makeCurrent());
  EXPECT_EQ(context().shareGroup()->pendingCount(), 0u);
  EXPECT_FALSE(glIsList(name));
}

TEST_F(EglContextTest, OwnersThatOutliveTheirContextsReleaseNothing) {
  Error error;
  std::unique_ptr<GLContext> shared = context().createSharedContext(&error);
  ASSERT_TRUE(shared) << error.message;
  DisplayList list;
  std::optional<Framebuffer> framebuffer;
  {
    const CurrentContext current(*shared, &error);
    ASSERT_TRUE(current) << error.message;
    ASSERT_TRUE(list.compile(drawRedSquare));
    framebuffer = Framebuffer::create(8, 8, &error);
    ASSERT_TRUE(framebuffer) << error.message;
  }
  // The framebuffer belonged to the shared context alone: it went with it.
  // The list lives on in the group's remaining context.
  shared.reset();
  framebuffer.reset();
  EXPECT_EQ(context().shareGroup()->pendingCount(), 0u);
  EXPECT_TRUE(list.isUsable());
  const GLuint name = list.name();
  list.invalidate();
  EXPECT_FALSE(glIsList(name));
}

}  // namespace
}  // namespace cloudreel::gl
