#include "camera/rw_trackball.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <array>
#include <limits>
#include <string>

#include "render/opengl_scene.h"
#include "scene/archive_helpers.h"
#include "support/near.h"
#include "support/pixel_harness.h"

namespace cloudreel {
namespace {

// 300 × 100 pixels: the ball's centre is (150, 50), its radius 50.
const OpenGLScene kScene = OpenGLScene::initWithWidthHeightFieldOfView(300, 100, 30);

using testing::expectNear;

// A drag over the view from one pointer position to another; the drag stays
// in progress.
void drag(RWTrackball& trackball, std::array<double, 2> from, std::array<double, 2> to) {
  trackball.beginTrackballAtPointForScene(from[0], from[1], kScene);
  trackball.rollToTrackball(to[0], to[1]);
}

TEST(RWTrackball, ADragTurnsByTheTruncatedPointerPositionsOverTheScene) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  const struct {
    std::string what;
    std::array<double, 2> from, to;
    AxisAngle turn;
  } cases[] = {
      // Rounding instead of truncating, or swapping width and height, moves
      // the start off the top of the ball.
      {"centre to the right rim", {150.7, 50.9}, {200.9, 50.6}, {90, 0, 1, 0}},
      {"centre to the top rim", {150.2, 50.2}, {150.9, 100.99}, {90, -1, 0, 0}},
      {"along the rim", {200, 50}, {150, 100}, {90, 0, 0, 1}},
      {"within one pixel", {150.2, 50.2}, {150.9, 50.9}, {0, 0, 0, 0}},
      // Coordinates past the 64-bit range saturate, NaN reads as 0.
      {"from far away", {-1e300, 1e300}, {nan, 50}, {45, 0, 0, 1}},
  };
  for (const auto& c : cases) {
    RWTrackball trackball;
    drag(trackball, c.from, c.to);
    expectNear(trackball.intermediate(), c.turn, 1e-4, c.what);
    expectNear(trackball.rotation(), {0, 0, 0, 0}, 1e-4, c.what);
  }
}

TEST(RWTrackball, EndingADragFoldsItsTurnIntoTheRotationAndMatrixReadsDegreesAsRadians) {
  RWTrackball trackball;
  drag(trackball, {200, 50}, {150, 100});
  trackball.addRotationToTrackball();
  expectNear(trackball.rotation(), {90, 0, 0, 1}, 1e-4, "one drag");
  EXPECT_EQ(trackball.intermediate(), (AxisAngle{0, 0, 0, 0}));
  drag(trackball, {200, 50}, {150, 100});
  trackball.addRotationToTrackball();
  expectNear(trackball.rotation(), {180, 0, 0, 1}, 1e-4, "two drags");

  // 180 radians about z, not π.
  const auto m = trackball.matrix()->mx();
  EXPECT_NEAR(m[0], -0.5984600690578581, 1e-4);
  EXPECT_NEAR(m[1], -0.8011526357338304, 1e-4);
  EXPECT_NEAR(m[4], 0.8011526357338304, 1e-4);
  EXPECT_NEAR(m[10], 1.0, 1e-12);
}

TEST(RWTrackball, ArchiveKeepsTheRotationUnderRotateKeysButNotTheDragInProgress) {
  auto trackball = std::make_shared<RWTrackball>();
  trackball->setName("Orbit");
  drag(*trackball, {150.7, 50.9}, {200.9, 50.6});
  trackball->addRotationToTrackball();
  drag(*trackball, {200, 50}, {150, 100});
  const Bytes data = KeyedArchiver::archivedDataWithRootObject(trackball);
  const auto decoded = testing::decodeAs<RWTrackball>(data);
  ASSERT_NE(decoded, nullptr);
  EXPECT_EQ(decoded->name(), "Orbit");
  EXPECT_EQ(decoded->rotation(), trackball->rotation());
  EXPECT_EQ(decoded->intermediate(), (AxisAngle{0, 0, 0, 0}));

  // The document format: four doubles, angle first.
  struct Keys : Object {
    void initWithCoder(KeyedUnarchiver& coder) override {
      for (std::size_t i = 0; i < 4; ++i) {
        values[i] = coder.decodeDoubleForKey("rotate" + std::to_string(i));
      }
    }
    AxisAngle values{};
  };
  ClassRegistry probe;
  probe.registerClass<Keys>("RWTrackball");
  Error error;
  const auto keys = std::dynamic_pointer_cast<Keys>(
      KeyedUnarchiver::unarchiveObjectWithData(data, &error, probe));
  ASSERT_NE(keys, nullptr) << error.message;
  EXPECT_EQ(keys->values, trackball->rotation());
}

TEST(RWTrackball, ACopyIsATrackballWithoutATurn) {
  RWTrackball trackball;
  trackball.setFieldOfView(50);
  drag(trackball, {200, 50}, {150, 100});
  trackball.addRotationToTrackball();
  const auto copy = copyOf<Camera>(trackball);
  ASSERT_EQ(copy->className(), "RWTrackball");
  EXPECT_EQ(copy->fieldOfView(), 50.0f);
  EXPECT_EQ(std::static_pointer_cast<RWTrackball>(copy)->rotation(), (AxisAngle{0, 0, 0, 0}));
}

using RWTrackballView = testing::PixelTest;

// The view turns the scene by the rotation, then by the drag, then moves it
// by minus the camera's position; the camera's own orientation is not used.
TEST_F(RWTrackballView, TheSceneTurnsByTheRotationThenTheDragThenMovesByThePosition) {
  RWTrackball trackball;
  trackball.setPositionZ(10);
  trackball.inertialToObject()->setEulerRotationType({0, 0, 45}, 11);
  trackball.inertialToObject()->setTranslation({5, 5, 5});
  const struct {
    std::array<double, 3> point, seen;
  } unturned[] = {{{1, 2, 3}, {1, 2, -7}}},
    turned[] = {
        // Rotation: 90° about y (x to -z); drag: 90° about -x (z up to y).
        {{1, 0, 0}, {0, -1, -10}},
        {{0, 0, 1}, {1, 0, -10}},
        {{0, 1, 0}, {0, 0, -11}},
    };
  const auto expectSeen = [&](const auto& cases, const std::string& what) {
    std::array<double, 16> m{};
    render(8, 8, [&] {
      trackball.setOrientation();
      glGetDoublev(GL_MODELVIEW_MATRIX, m.data());
    });
    for (const auto& c : cases) {
      const auto [x, y, z] = c.point;
      for (std::size_t i = 0; i < 3; ++i) {
        EXPECT_NEAR(m[i] * x + m[4 + i] * y + m[8 + i] * z + m[12 + i], c.seen[i], 1e-5)
            << what << ", point (" << x << ", " << y << ", " << z << "), component " << i;
      }
    }
  };
  expectSeen(unturned, "a new trackball");
  drag(trackball, {150, 50}, {200, 50});
  trackball.addRotationToTrackball();
  drag(trackball, {150, 50}, {150, 100});
  expectSeen(turned, "during a drag");
}

}  // namespace
}  // namespace cloudreel
