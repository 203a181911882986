#include "camera/camera.h"

#include <epoxy/gl.h>
#include <fmt/format.h>
#include <gtest/gtest.h>

#include <array>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "camera/scene_camera.h"
#include "platform/notification_center.h"
#include "render/opengl_scene.h"
#include "render/render_options.h"
#include "scene/archive_helpers.h"
#include "support/memory_defaults.h"
#include "support/near.h"
#include "support/pixel_harness.h"

namespace cloudreel {
namespace {

using Point = std::array<double, 3>;
using testing::applied;
using testing::roundTrip;

// What a camera sees through and from where, in one comparable line.
std::string lens(const Camera& c) {
  return fmt::format("{} {} fov {} near {} far {} aspect {} at {}", c.className(), c.name(),
                     c.fieldOfView(), c.zNear(), c.zFar(), c.aspect(), c.positionAsString());
}

TEST(Camera, NewCopiedAndDecodedCamerasGetTheirLensAsTheyShould) {
  auto lefty = Camera::initWithZDistance(4);
  lefty->setName("Left eye");
  lefty->setFieldOfView(45);
  lefty->setZNear(0.5f);
  lefty->setZFar(200);
  lefty->setAspect(1.5f);
  // A camera written before the planes were saved: no "zNear", no "zFar".
  struct CameraWithoutPlanes : Camera {
    void encodeWithCoder(KeyedArchiver& coder) const override {
      Animatable3DObject::encodeWithCoder(coder);
      coder.encodeString(name(), "name");
      coder.encodeFloat(fieldOfView(), "fieldOfView");
    }
  };
  auto older = std::make_shared<CameraWithoutPlanes>();
  older->setZNear(3);
  older->setZFar(4);
  const AffineTransform::Matrix turned = AffineTransform::initWithEulerType({0, 0, 90}, 11)->mx();
  const auto placed = Camera::initWithMatrixTranslate(turned, {1, -2, 3});
  EXPECT_EQ(placed->inertialToObject()->mx(), turned);

  const struct {
    std::shared_ptr<Camera> camera;
    std::string seen;
  } cases[] = {
      {Camera::initWithZDistance(10),
       "Camera Camera fov 30 near 1 far 30 aspect 1 at Vector3: <0.00, 0.00, 10.00>"},
      {placed, "Camera Camera fov 30 near 1 far 30 aspect 1 at Vector3: <1.00, -2.00, 3.00>"},
      // A copy keeps the placement and the field of view only.
      {copyOf(*lefty),
       "Camera Camera fov 45 near 1 far 30 aspect 1 at Vector3: <0.00, 0.00, 4.00>"},
      // The aspect is not archived.
      {roundTrip(lefty),
       "Camera Left eye fov 45 near 0.5 far 200 aspect 1 at Vector3: <0.00, 0.00, 4.00>"},
      {roundTrip<Camera>(older),
       "Camera Camera fov 30 near 1 far 30 aspect 1 at Vector3: <0.00, 0.00, 0.00>"},
  };
  for (const auto& c : cases) {
    ASSERT_NE(c.camera, nullptr);
    EXPECT_EQ(lens(*c.camera), c.seen);
  }
}

TEST(Camera, SelectingPostsActivateAndDeactivateFromTheCamera) {
  Camera camera;
  Camera other;
  Observer observer;
  std::vector<std::string> received;
  for (auto name : {kCameraActivateNotification, kCameraDeactivateNotification}) {
    NotificationCenter::defaultCenter().addObserver(
        observer, std::string(name), &camera,
        [&](const Notification& n) { received.push_back(n.name); });
  }
  camera.setSelected(true);
  other.setSelected(true);
  camera.setSelected(false);
  EXPECT_EQ(received, (std::vector<std::string>{"KTPointDocument_CameraActivateNotification",
                                                "KTPointDocument_CameraDeactivateNotification"}));
  NotificationCenter::defaultCenter().removeObserver(observer);
}

TEST(SceneCamera, EachAngleTurnsAboutItsOwnAxisAndResetsTheTranslation) {
  const struct {
    std::string what;
    std::function<void(SceneCamera&)> set;
    Point from, to;
  } cases[] = {
      {"heading 90 turns about y", [](SceneCamera& c) { c.setHeading(90); }, {1, 0, 0}, {0, 0, -1}},
      {"pitch 90 turns about x", [](SceneCamera& c) { c.setPitch(90); }, {0, 1, 0}, {0, 0, 1}},
      {"bank 90 turns about z", [](SceneCamera& c) { c.setBank(90); }, {1, 0, 0}, {0, 1, 0}},
      // Heading applies first, then pitch: x goes to -z, then up to y.
      {"heading then pitch",
       [](SceneCamera& c) { c.setRotate(Vector3(90, 0, 90)); },
       {1, 0, 0},
       {0, 1, 0}},
  };
  for (const auto& c : cases) {
    SceneCamera camera;
    camera.inertialToObject()->setTranslation({1, 2, 3});
    c.set(camera);
    testing::expectNear(applied(*camera.inertialToObject(), c.from), c.to, 1e-6, c.what);
    testing::expectNear(applied(*camera.inertialToObject(), {0, 0, 0}), {0, 0, 0}, 1e-6, c.what);
  }
}

TEST(SceneCamera, SetRotateTakesPitchBankHeadingWhileRotateAnswersHeadingPitchBank) {
  auto camera = std::make_shared<SceneCamera>();
  camera->setRotate(Vector3(10, 20, 30));
  EXPECT_EQ(fmt::format("{} {} {}", camera->pitch(), camera->bank(), camera->heading()),
            "10 20 30");
  EXPECT_EQ(camera->rotate()->description(), "Vector3: <30.00, 10.00, 20.00>");
  // Decoding takes the saved transform as it is, not one rebuilt from the
  // angles.
  camera->inertialToObject()->setIdentidy();
  const auto decoded = roundTrip(camera);
  ASSERT_NE(decoded, nullptr);
  EXPECT_EQ(decoded->rotate()->description(), "Vector3: <30.00, 10.00, 20.00>");
  EXPECT_EQ(decoded->inertialToObject()->mx(), AffineTransform::kIdentity);
  // Feeding the answer back moves every angle.
  camera->setRotate(*camera->rotate());
  EXPECT_EQ(camera->rotate()->description(), "Vector3: <20.00, 30.00, 10.00>");
}

// --- drawing

using testing::Box;
using testing::Frame;
using testing::Rgba;

using CameraDrawing = testing::PixelTest;
constexpr Rgba kBlue{0, 0, 255, 255};
constexpr Rgba kGreen{0, 255, 0, 255};

TEST_F(CameraDrawing, TheFrustumIsDrawnInEditorFramesOnly) {
  // The frustum colours come from the user defaults: blue, and green when
  // selected.
  const testing::MemoryDefaults defaults;
  setColorForDefaultsKey(UserDefaults::standardUserDefaults(), *Color::colorWithRGBA(0, 0, 1, 1),
                         kFrustumColorKey);
  setColorForDefaultsKey(UserDefaults::standardUserDefaults(), *Color::colorWithRGBA(0, 1, 0, 1),
                         kSelectedFrustumColorKey);
  const struct {
    std::optional<bool> editor;
    bool selected;
    Rgba frustum;
  } cases[] = {{std::nullopt, false, kBlue},
               {false, true, kGreen},
               {true, false, kBlue},
               {true, true, kGreen}};
  for (const auto& c : cases) {
    SCOPED_TRACE(::testing::Message()
                 << "editor " << (c.editor ? int(*c.editor) : -1) << ", selected " << c.selected);
    Camera camera;
    camera.setFieldOfView(90);  // the frustum's half-width is its length
    camera.setAspect(2);
    camera.setPositionX(1);
    camera.setSelected(c.selected);
    RenderOptions options;
    if (c.editor) {
      options.setValueForKey(*c.editor, kRenderOptionEditor);
    }
    // Seen from the front, 20 pixels a unit: the four lines of length 2
    // cross at the camera, 20 pixels right of the centre.
    const Frame frame = render(161, 101, [&] {
      glScaled(20, 20, 20);
      camera.drawGLWithOptions(options);
    });
    if (c.editor != true) {
      EXPECT_EQ(frame.countDrawn(), 0);
      continue;
    }
    EXPECT_TRUE(
        testing::boundsNear(frame.drawnBounds(), {100 - 40, 50 - 20, 101 + 40, 51 + 20}, 1));
    EXPECT_GT(frame.count(c.frustum), 100);
    // The body only for the selected camera, in white.
    EXPECT_EQ(frame.count(testing::kWhite) > 0, c.selected);
  }
}

// Where a point lands in a 65 × 65 frame seen through a camera with a 30°
// field of view.
enum class Lands { Centre, RightOfCentre, AboveCentre, Nowhere };

struct Sighting {
  Point point;
  Lands lands;
};

class CameraView : public testing::PixelTest {
 protected:
  void expectSightings(const std::string& what, const Camera& camera,
                       const std::vector<Sighting>& sightings) {
    const auto scene = OpenGLScene::initWithWidthHeightFieldOfView(65, 65, 30);
    const Box centre{31, 31, 34, 34};
    for (const Sighting& s : sightings) {
      SCOPED_TRACE(::testing::Message() << what << ", point (" << s.point[0] << ", " << s.point[1]
                                        << ", " << s.point[2] << ")");
      const Frame frame = render(65, 65, [&] {
        scene.setupFrustumForCamera(camera);
        camera.setOrientation();
        glPointSize(3);
        glColor3ub(255, 0, 0);
        glBegin(GL_POINTS);
        glVertex3dv(s.point.data());
        glEnd();
      });
      const auto bounds = frame.drawnBounds();
      if (s.lands == Lands::Nowhere) {
        EXPECT_FALSE(bounds);
        continue;
      }
      ASSERT_TRUE(bounds);
      if (s.lands == Lands::Centre) {
        EXPECT_EQ(*bounds, centre);
      } else if (s.lands == Lands::RightOfCentre) {
        EXPECT_GT(bounds->left, centre.right + 5);
        EXPECT_EQ(bounds->top, centre.top);
      } else {
        EXPECT_LT(bounds->bottom, centre.top - 5);
        EXPECT_EQ(bounds->left, centre.left);
      }
    }
  }
};

TEST_F(CameraView, ACameraSeesDownItsOwnMinusZFromItsPosition) {
  expectSightings("10 units up z", *Camera::initWithZDistance(10),
                  {{{0, 0, 0}, Lands::Centre},
                   {{1, 0, 0}, Lands::RightOfCentre},
                   {{0, 1, 0}, Lands::AboveCentre},
                   {{0, 0, 20}, Lands::Nowhere}});

  // Turned to look down -x; its right is then -z. A sign error would look
  // down +x, a translation applied before the turn would look past it.
  const auto turned = SceneCamera::initWithZDistance(10);
  turned->setHeading(90);
  expectSightings("heading 90", *turned,
                  {{{-5, 0, 10}, Lands::Centre},
                   {{-5, 0, 9}, Lands::RightOfCentre},
                   {{-5, 1, 10}, Lands::AboveCentre},
                   {{5, 0, 10}, Lands::Nowhere},
                   {{0, 0, 0}, Lands::Nowhere}});
}

TEST_F(CameraView, TheViewUndoesThePlacementOfEveryTransform) {
  Camera camera;
  camera.objectToWorld()->setTranslation({3, 4, 5});
  camera.inertialToObject()->setEulerRotationType({20, -35, 50}, 11);
  camera.inertialToObject()->setTranslation({0.5, -1, 2});
  camera.animationTransform()->setEulerRotationType({-15, 10, 25}, 11);
  camera.animationTransform()->setTranslation({1, 0, -0.5});
  // The placement: animation, then orientation, then position.
  AffineTransform placement(camera.animationTransform()->mx());
  placement.multiplyByMatrix(*camera.inertialToObject());
  placement.multiplyByMatrix(*camera.objectToWorld());
  expectSightings("placed and animated", camera,
                  {{applied(placement, {0, 0, -6}), Lands::Centre},
                   {applied(placement, {1, 0, -6}), Lands::RightOfCentre},
                   {applied(placement, {0, 1, -6}), Lands::AboveCentre},
                   {applied(placement, {0, 0, 6}), Lands::Nowhere}});
}

}  // namespace
}  // namespace cloudreel
