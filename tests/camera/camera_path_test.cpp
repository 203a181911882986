// Camera paths: the poses they read, interpolate and hand out, their
// archives, and what a camera field draws.
#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <cmath>
#include <optional>
#include <string>

#include "camera/camera.h"
#include "camera/camera_field.h"
#include "camera/discrete_camera_path.h"
#include "camera/scene_camera.h"
#include "camera/slerp_camera_path.h"
#include "camera/zxy_camera_path.h"
#include "geometry/rotations.h"
#include "render/render_options.h"
#include "scene/archive_helpers.h"
#include "support/memory_defaults.h"
#include "support/near.h"
#include "support/pixel_harness.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

using Matrix = AffineTransform::Matrix;
// Registered defaults (a frame rate of 25), so paths do not read the user's
// own settings.
using testing::MemoryDefaults;

std::array<double, 3> positionOf(const Camera& camera) {
  return testing::applied(*camera.objectToWorld(), {0, 0, 0});
}

void expectPose(const std::shared_ptr<Camera>& camera, const Matrix& orientation,
                const std::array<double, 3>& position, double tolerance = 0) {
  ASSERT_NE(camera, nullptr);
  testing::expectNear(camera->inertialToObject()->mx(), orientation, tolerance, "orientation");
  testing::expectNear(positionOf(*camera), position, tolerance, "position");
}

const char* const kTwoMatrices =
    "2\n"
    "1 0 0 5 0 1 0 6 0 0 1 7 0 0 0 1\n"
    " 0 -1 0 1   1 0 0 2\t0 0 1 3  0.5 0.25 0.125 9 \n";
// The second line's rotation maps x to y; its bottom row lands in storage
// 3, 7 and 11 and its corner is replaced by 1.
constexpr Matrix kSecondOrientation = {0, 1, 0, 0.5, -1, 0, 0, 0.25, 0, 0, 1, 0.125, 0, 0, 0, 1};

TEST(DiscreteCameraPath, EachMatrixLineIsAFramesOrientationAndScaledPosition) {
  const MemoryDefaults defaults;
  const testing::TempDir dir;
  const auto path =
      DiscreteCameraPath::initWithURL(testing::writeFile(dir / "walk.txt", kTwoMatrices));
  ASSERT_NE(path, nullptr);
  EXPECT_EQ(path->name(), "walk.txt");
  EXPECT_EQ(path->nFrames(), 2);
  EXPECT_EQ(path->byteSize(), 2u * 184u);
  EXPECT_EQ(path->fps(), 25);
  expectPose(path->cameraInObjectSpaceForFrame(0), AffineTransform::kIdentity, {5, 6, 7});
  expectPose(path->cameraInObjectSpaceForTime(0.5f), kSecondOrientation, {1, 2, 3});
  path->setTranslateGain(2);
  expectPose(path->cameraInObjectSpaceForFrame(0), AffineTransform::kIdentity, {10, 12, 14});
  // Frames outside the records, however asked for, give no camera.
  for (const int frame : {2, -1}) {
    EXPECT_EQ(path->cameraInObjectSpaceForFrame(frame), nullptr) << frame;
  }
  EXPECT_EQ(path->cameraInObjectSpaceForTime(1.0f), nullptr);
  path->setNFrames(1000);  // a frame count set apart from the records
  EXPECT_EQ(path->cameraInObjectSpaceForFrame(500), nullptr);

  // The path's transforms apply after the camera's own.
  path->setNFrames(2);
  path->setTranslateGain(1);
  path->objectToWorld()->setTranslation({100, 0, 0});
  const Matrix turned = AffineTransform::initWithEulerType({90, 0, 0}, 11)->mx();
  path->inertialToObject()->setDoubles(turned);
  expectPose(path->cameraInWorldSpaceForFrame(0), turned, {105, 6, 7});
}

TEST(ZXYCameraPath, AnglesMakeTheTypeZeroEulerRotationWithAZeroCorner) {
  const auto path = ZXYCameraPath::initWithText("2\n0 0 0 0 0 0\n1 2 3 10 20 30\n");
  ASSERT_NE(path, nullptr);
  Matrix identityBlock = AffineTransform::kIdentity;
  identityBlock[15] = 0;
  expectPose(path->cameraInObjectSpaceForFrame(0), identityBlock, {0, 0, 0});
  // α = 10, β = 20, γ = 30 is the type-0 rotation of (β, α, γ), to the
  // single precision the angles are rounded to.
  Matrix turned = AffineTransform::initWithEulerType({20, 10, 30}, 0)->mx();
  turned[15] = 0;
  expectPose(path->cameraInObjectSpaceForFrame(1), turned, {1, 2, 3}, 1e-6);
}

TEST(DiscreteCameraPath, DamagedOrHostileTextNeverOverreadsOrOverallocates) {
  const struct {
    const char* text;
    std::optional<int> frames;  // nothing: no path
    std::array<double, 3> lastPosition;
  } cases[] = {
      {"", 0, {}},
      {"garbage", 0, {}},
      // A count past what the text can hold is cut to that.
      {"2000000000\n1 2 3 4 5 6", 1, {1, 2, 3}},
      {"99999999999999999999999 1 2 3 4 5 6", 1, {1, 2, 3}},
      // Taken as a size, a negative count is memory that cannot be had.
      {"-3\n1 2 3 4 5 6", std::nullopt, {}},
      // A number that does not scan stops the reading there: every later
      // number reads as 0.
      {"2\n1 2 3 x 5 6\n7 8 9 10 11 12\n", 2, {0, 0, 0}},
      {"1\n1e999 -1e999 1e-999 0 0 0", 1, {INFINITY, -INFINITY, 0}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.text);
    ::testing::internal::CaptureStdout();
    const auto path = ZXYCameraPath::initWithText(c.text);
    const std::string printed = ::testing::internal::GetCapturedStdout();
    if (!c.frames) {
      EXPECT_EQ(path, nullptr);
      EXPECT_EQ(printed, "Couldn't allocate memory!\n");
      continue;
    }
    ASSERT_NE(path, nullptr);
    ASSERT_EQ(path->nFrames(), *c.frames);
    if (*c.frames > 0) {
      EXPECT_EQ(path->points().back().position, c.lastPosition);
    }
  }
}

TEST(SLERPCameraPath, RunsFromTheStartPoseAtFrameZeroToTheEndPoseAtTheLastFrame) {
  const MemoryDefaults defaults;
  SLERPCameraPath path;
  ASSERT_EQ(path.nFrames(), 200);
  path.setFrTranslate(Vector3::vectorWithXYZ(1, 2, 3));
  path.setToTranslate(Vector3::vectorWithXYZ(11, -2, 3));
  path.setToRotate(Vector3::vectorWithXYZ(0, 0, 90));
  path.setTranslateGain(5);  // not applied to interpolated poses
  const auto pose = [](double a3) {
    Quaternion q{};
    eulerToQuaternion(q, 0, 0, a3);
    Matrix m{};
    quaternionToMatrix(q, m);
    return m;
  };
  expectPose(path.cameraInObjectSpaceForFrame(0), pose(0), {1, 2, 3}, 1e-12);
  expectPose(path.cameraInObjectSpaceForFrame(199), pose(90), {11, -2, 3}, 1e-12);
  // Halfway along one axis is half the turn.
  expectPose(path.cameraInObjectSpaceForTime(0.5f), pose(45), {6, 0, 3}, 1e-12);
  // One frame has no span: the start pose, not a division by zero.
  path.setNFrames(1);
  expectPose(path.cameraInObjectSpaceForFrame(0), pose(0), {1, 2, 3}, 1e-12);
}

TEST(CameraPath, TimeAndDurationFollowFramesAndRate) {
  const MemoryDefaults defaults;
  const struct {
    int frames;
    float t;
    int currentFrame;
  } cases[] = {{10, 0.5f, 5}, {10, 1.0f, 10}, {10, 0.99f, 9}, {10, NAN, 0}, {7, 1e30f, INT32_MAX}};
  for (const auto& c : cases) {
    SLERPCameraPath path;
    path.setNFrames(c.frames);
    path.setCurrentFrameForTime(c.t);
    EXPECT_EQ(path.currentFrame(), c.currentFrame) << c.frames << " frames, t " << c.t;
  }
  SLERPCameraPath path;
  path.setNFrames(50);
  EXPECT_EQ(path.durationAsFormattedString(), "2.00 s");
  EXPECT_EQ(path.description(), "SLERPCameraPath:SLERP Path");
}

TEST(CameraPath, EveryKindComesBackFromTheArchiveHandingOutTheSameCameras) {
  const MemoryDefaults defaults;
  auto slerp = std::make_shared<SLERPCameraPath>();
  slerp->setToRotate(Vector3::vectorWithXYZ(10, 20, 30));
  slerp->setFrTranslate(Vector3::vectorWithXYZ(-1, 0, 4));
  auto field = std::make_shared<CameraField>();
  field->addCamera(Camera::initWithZDistance(3));
  field->addCamera(SceneCamera::initWithZDistance(-2));
  field->setFrustumLength(9);  // display settings are not archived
  const std::shared_ptr<CameraPath> paths[] = {
      DiscreteCameraPath::initWithText(kTwoMatrices),
      ZXYCameraPath::initWithText("2\n1 2 3 10 20 30\n-1 0 5 0 90 0"), slerp, field};
  for (const auto& path : paths) {
    SCOPED_TRACE(path->className());
    path->setName("Path");
    path->setFps(0);  // reads back as the default
    path->setTranslateGain(0.5f);
    const auto back = testing::roundTrip(path);
    ASSERT_NE(back, nullptr);
    EXPECT_EQ(back->className(), path->className());
    EXPECT_EQ(back->name(), "Path");
    EXPECT_EQ(back->nFrames(), path->nFrames());
    EXPECT_EQ(back->fps(), 25);
    EXPECT_EQ(back->translateGain(), 0.5f);
    for (const float t : {0.0f, 0.3f, 0.6f}) {
      const auto camera = path->cameraInObjectSpaceForTime(t);
      ASSERT_NE(camera, nullptr);
      expectPose(back->cameraInObjectSpaceForTime(t), camera->inertialToObject()->mx(),
                 positionOf(*camera), 1e-6);
    }
  }
  EXPECT_EQ(std::dynamic_pointer_cast<CameraField>(testing::roundTrip(field))->frustumLength(),
            2.0f);
}

TEST(DiscreteCameraPath, AShortRecordBlobIsCutToTheRecordsItHolds) {
  const MemoryDefaults defaults;
  // Three frames announced, one record and the first two doubles of the
  // next stored, as a damaged document might hold.
  std::vector<double> blob(23 + 2, 0.0);
  blob[0] = 4;
  blob[23] = 8;
  blob[24] = 9;
  for (const int announced : {3, 2000000000}) {
    const auto path =
        testing::decodeFrom<DiscreteCameraPath>("DiscreteCameraPath", [&](KeyedArchiver& coder) {
          coder.encodeInt32(announced, "nFrames");
          coder.encodeBytes({reinterpret_cast<const std::uint8_t*>(blob.data()), 25 * 8}, "points");
        });
    ASSERT_NE(path, nullptr);
    ASSERT_EQ(path->nFrames(), 2);
    EXPECT_EQ(path->points()[0].position[0], 4);
    EXPECT_EQ(path->points()[1].position, (std::array<double, 3>{8, 9, 0}));
    EXPECT_EQ(path->points()[1].matrix, Matrix{});
  }
}

TEST(CameraField, FramesAreCopiesOfTheCamerasAndNothingPastThem) {
  const MemoryDefaults defaults;
  CameraField field;
  int announced = 0;
  CallbackObserver counter([&](const auto&...) { ++announced; });
  field.addObserver(counter, "cameras", ObservingOptions::None, "");
  field.addCamera(Camera::initWithZDistance(1));
  field.addCamera(Camera::initWithZDistance(2));
  EXPECT_EQ(announced, 2);
  EXPECT_EQ(field.nFrames(), 2);
  const auto copy = field.cameraInObjectSpaceForTime(0.5f);
  ASSERT_NE(copy, nullptr);
  EXPECT_NE(copy, field.cameras()[1]);
  EXPECT_EQ(copy->positionZ(), 2.0f);
  for (const int frame : {2, -1}) {
    EXPECT_EQ(field.cameraInObjectSpaceForFrame(frame), nullptr) << frame;
  }
  EXPECT_EQ(field.cameraInObjectSpaceForTime(1.0f), nullptr);
  field.removeObserver(counter, "cameras");
}

using CameraFieldDrawing = testing::PixelTest;

TEST_F(CameraFieldDrawing, FrustaAreDrawnInEditorFramesOnly) {
  const MemoryDefaults defaults;
  CameraField field;
  field.addCamera(Camera::initWithZDistance(0));
  const auto right = Camera::initWithZDistance(0);
  right->setPositionX(2);
  field.addCamera(right);
  for (const bool editor : {true, false}) {
    RenderOptions options;
    if (editor) {
      options.setValueForKey(true, kRenderOptionEditor);
    }
    const testing::Frame frame = render(121, 81, [&] {
      glScaled(10, 10, 10);
      field.drawGLWithOptions(options);
    });
    EXPECT_EQ(frame.countDrawn() > 0, editor) << "editor " << editor;
    if (editor) {
      // Both cameras: lines around the centre and around 20 pixels right.
      EXPECT_GT(frame.countDrawn(testing::kBlack, 0, testing::Box{55, 30, 66, 51}), 0);
      EXPECT_GT(frame.countDrawn(testing::kBlack, 0, testing::Box{75, 30, 86, 51}), 0);
    }
  }
}

}  // namespace
}  // namespace cloudreel
