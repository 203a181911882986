// The camera-path render command: only a selected camera path renders, its
// frames land in the image folder of the defaults at 720 × 480, and the user
// is told how many and where.
#include "render/camera_path_render.h"

#include <gtest/gtest.h>

#include <set>
#include <string>

#include "camera/zxy_camera_path.h"
#include "platform/user_defaults.h"
#include "render/gl/image_file.h"
#include "render/opengl_scene.h"
#include "scene/layer.h"
#include "scene/my_document.h"
#include "support/memory_defaults.h"
#include "support/pixel_harness.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

class CameraPathRenderTest : public testing::PixelTest {
 protected:
  testing::MemoryDefaults defaults;
  testing::TempDir dir;
  MyDocument document;
  OpenGLScene viewScene =
      OpenGLScene::initWithWidthHeightFieldOfViewZNearZFar(320, 200, 40.0, 0.5f, 50.0f);
};

TEST_F(CameraPathRenderTest, OnlyASelectedPathRendersAndTheUserHearsWhatWasWrittenWhere) {
  UserDefaults::standardUserDefaults().setObjectForKey(dir.path().string(), "KTImageSavePath");
  // Nothing selected, then a layer that is no camera path: no render, no files.
  EXPECT_FALSE(renderSelectedCameraPath(document, viewScene));
  const auto plain = std::make_shared<Layer>();
  document.addLayer(plain);
  document.setSelectedLayer(plain);
  EXPECT_FALSE(renderSelectedCameraPath(document, viewScene));
  EXPECT_TRUE(testing::fileNamesIn(dir.path()).empty());

  const auto path = ZXYCameraPath::initWithText("2\n0 0 0 0 0 0\n0 0 1 0 0 0\n");
  ASSERT_TRUE(path);
  document.addLayer(path);
  document.setSelectedLayer(path);
  const auto result = renderSelectedCameraPath(document, viewScene);
  ASSERT_TRUE(result);
  EXPECT_EQ(result->frames, 2);
  EXPECT_EQ(result->folder, dir.path());
  EXPECT_EQ(testing::fileNamesIn(dir.path()),
            (std::set<std::string>{"out_0000.tiff", "out_0001.tiff"}));
  const auto frame = gl::readTiff(dir / "out_0001.tiff");
  ASSERT_TRUE(frame);
  EXPECT_EQ(frame->width, 720);
  EXPECT_EQ(frame->height, 480);

  const Alert told = cameraPathRenderAlert(*result);
  EXPECT_EQ(told.messageText, "Rendered 2 frames");
  EXPECT_EQ(told.informativeText,
            "The frames are out_0000.tiff to out_0001.tiff in " + dir.path().string() + ".");
  EXPECT_EQ(cameraPathRenderAlert({1, dir.path(), {}}).informativeText,
            "The frame is out_0000.tiff in " + dir.path().string() + ".");
  EXPECT_EQ(cameraPathRenderAlert({0, dir.path(), {}}).messageText, "No frames were rendered");
}

}  // namespace
}  // namespace cloudreel
