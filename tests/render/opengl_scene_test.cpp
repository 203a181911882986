#include "render/opengl_scene.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>

#include "camera/camera.h"
#include "support/near.h"
#include "support/pixel_harness.h"

namespace cloudreel {
namespace {

using testing::Frame;
using Matrix = std::array<float, 16>;

class OpenGLSceneTest : public testing::PixelTest {
 protected:
  // The projection matrix that the scene sets up for the camera.
  Matrix projectionFor(const OpenGLScene& scene, const Camera& camera) {
    Matrix m{};
    GLint mode = 0;
    render(8, 8, [&] {
      scene.setupFrustumForCamera(camera);
      glGetIntegerv(GL_MATRIX_MODE, &mode);
      glGetFloatv(GL_PROJECTION_MATRIX, m.data());
    });
    EXPECT_EQ(mode, GL_MODELVIEW);
    return m;
  }
};

// A camera whose frustum half-height at the near plane equals that plane's
// distance (a 90° field of view), standing apart from the scene's own values.
std::shared_ptr<Camera> wideCamera() {
  auto camera = std::make_shared<Camera>();
  camera->setFieldOfView(90);
  camera->setZNear(2);
  camera->setZFar(50);
  return camera;
}

TEST_F(OpenGLSceneTest, TheCamerasFieldOfViewSpansTheShorterSideBetweenTheCamerasPlanes) {
  const auto camera = wideCamera();
  const struct {
    int width, height;
    double aspect;
    float smaller, xScale, yScale;
  } cases[] = {
      {200, 100, 2.0, 100, 0.5f, 1.0f},
      {100, 200, 0.5, 100, 1.0f, 0.5f},
      {100, 100, 1.0, 100, 1.0f, 1.0f},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(::testing::Message() << c.width << "×" << c.height);
    // The scene's own field of view and planes play no part.
    const auto scene =
        OpenGLScene::initWithWidthHeightFieldOfViewZNearZFar(c.width, c.height, 60, 1, 30);
    EXPECT_EQ(scene.aspectRatio(), c.aspect);
    EXPECT_EQ(scene.smallerDimension(), c.smaller);
    // Depth: -(far + near) / (far - near) and -2 far near / (far - near).
    testing::expectNear(
        projectionFor(scene, *camera),
        {c.xScale, 0, 0, 0, 0, c.yScale, 0, 0, 0, 0, -52.0f / 48, -1, 0, 0, -200.0f / 48, 0}, 1e-5);
  }

  // Without height the window is infinitely wide: no horizontal scale, a NaN
  // depth column, nothing drawn, and no OpenGL error.
  const auto flat = OpenGLScene::initWithWidthHeightFieldOfView(100, 0, 30);
  EXPECT_EQ(flat.aspectRatio(), HUGE_VAL);
  EXPECT_EQ(flat.zNear(), 1.0);
  EXPECT_EQ(flat.zFar(), 30.0);
  const Matrix m = projectionFor(flat, *camera);
  EXPECT_EQ(m[0], 0.0f);
  EXPECT_NEAR(m[5], 1.0f, 1e-6);
  EXPECT_TRUE(std::isnan(m[10]));
  EXPECT_TRUE(std::isnan(OpenGLScene::initWithWidthHeightFieldOfView(0, 0, 30).aspectRatio()));
}

TEST_F(OpenGLSceneTest, AStereoOffsetSlidesTheWindowWithoutMovingTheCamera) {
  const auto camera = wideCamera();
  // A point straight ahead moves left in the left eye's image (positive
  // offset) and right in the right eye's, by the same amount at any depth:
  // 0.2 of a near-plane half-height of 1 is 6.5 of 32.5 half-rows.
  camera->setZNear(1);
  const auto scene = OpenGLScene::initWithWidthHeightFieldOfView(129, 65, 30);
  for (const float offset : {0.2f, -0.2f}) {
    for (const double depth : {-2.0, -20.0}) {
      const Frame drawn = render(129, 65, [&] {
        scene.setupFrustumForCamera(*camera, offset);
        glPointSize(3);
        glColor3ub(255, 0, 0);
        glBegin(GL_POINTS);
        glVertex3d(0, 0, depth);
        glEnd();
      });
      const auto bounds = drawn.drawnBounds();
      ASSERT_TRUE(bounds) << offset << " at " << depth;
      EXPECT_NEAR((bounds->left + bounds->right) / 2.0, 64.5 - offset / 0.2 * 6.5, 1.0)
          << offset << " at " << depth;
    }
  }
}

TEST_F(OpenGLSceneTest, SetSizeTruncatesAndSetsTheViewport) {
  const struct {
    double width, height;
    int truncatedWidth, truncatedHeight;
  } cases[] = {
      {640.9, 480.99, 640, 480},
      {-0.5, 10.7, 0, 10},
      {std::numeric_limits<double>::quiet_NaN(), 1e300, 0, std::numeric_limits<int>::max()},
  };
  for (const auto& c : cases) {
    auto scene = OpenGLScene::initWithWidthHeightFieldOfView(1, 1, 30);
    std::array<GLint, 4> viewport{};
    std::array<GLint, 2> largest{};
    render(8, 8, [&] {
      scene.setSize(c.width, c.height);
      glGetIntegerv(GL_VIEWPORT, viewport.data());
      glGetIntegerv(GL_MAX_VIEWPORT_DIMS, largest.data());
    });
    EXPECT_EQ(scene.width(), c.truncatedWidth) << c.width;
    EXPECT_EQ(scene.height(), c.truncatedHeight) << c.height;
    EXPECT_EQ(viewport, (std::array<GLint, 4>{0, 0, std::min(c.truncatedWidth, largest[0]),
                                              std::min(c.truncatedHeight, largest[1])}));
  }
}

}  // namespace
}  // namespace cloudreel
