// Off-screen frames as files: where known points land in the TIFFs read back
// from disk, their colours and depth, the stereo pair's shift, the names the
// files get, and what a failure to make or write them does.
#include "render/offline_gl_renderer.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <cmath>
#include <filesystem>
#include <set>
#include <string>
#include <vector>

#include "camera/camera.h"
#include "camera/zxy_camera_path.h"
#include "platform/log.h"
#include "platform/user_defaults.h"
#include "render/gl/image_file.h"
#include "render/render_properties_controller.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"
#include "support/memory_defaults.h"
#include "support/pixel_harness.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

namespace fs = std::filesystem;

constexpr int kWidth = 64;
constexpr int kHeight = 32;
constexpr float kDistance = 5.0f;

// A camera at the origin looking down -z, 90° across the shorter side, near
// 1 and far 10: on a 64 × 32 frame the window at the near plane spans
// x in [-2, 2] and y in [-1, 1].
std::shared_ptr<Camera> testCamera() {
  auto camera = std::make_shared<Camera>();
  camera->setFieldOfView(90.0f);
  camera->setZNear(1.0f);
  camera->setZFar(10.0f);
  return camera;
}

// The world point at kDistance in front of the camera that projects to the
// centre of pixel (px, py), y counted down from the top row.
std::array<float, 3> pointAtPixel(int px, int py) {
  const double ndcX = (px + 0.5) / kWidth * 2 - 1;
  const double ndcY = 1 - (py + 0.5) / kHeight * 2;
  return {static_cast<float>(ndcX * 2 * kDistance), static_cast<float>(ndcY * 1 * kDistance),
          -kDistance};
}

struct Dot {
  int px, py;
  std::uint8_t r, g, b;
};

std::shared_ptr<PointLayer> layerOf(const std::vector<Dot>& dots) {
  auto layer = std::make_shared<PointLayer>();
  const auto n = static_cast<std::int32_t>(dots.size());
  layer->allocatePointArrayWithSize(n);
  layer->setNPoints(n);
  for (std::size_t i = 0; i < dots.size(); ++i) {
    const auto [x, y, z] = pointAtPixel(dots[i].px, dots[i].py);
    layer->colorPoints()[i] = {x, y, z, dots[i].r, dots[i].g, dots[i].b, 0};
  }
  layer->setPointSize(1.0f);
  return layer;
}

class OfflineRendererTest : public testing::PixelTest {
 protected:
  std::unique_ptr<OfflineGLRenderer> renderer(bool depth, int width = kWidth,
                                              int height = kHeight) {
    const auto context = document.sharedGLContext();
    if (!context) {
      return nullptr;
    }
    auto made = OfflineGLRenderer::initWithSceneContextExportDepth(
        OpenGLScene::initWithWidthHeightFieldOfView(width, height, 30.0), *context, depth);
    if (made) {
      made->setOutputPath(dir.path());
    }
    return made;
  }
  std::set<std::string> filesWritten() const { return testing::fileNamesIn(dir.path()); }
  static std::array<int, 3> rgbAt(const gl::TiffImage& image, int x, int y) {
    return {image.sample(x, y, 0), image.sample(x, y, 1), image.sample(x, y, 2)};
  }

  testing::MemoryDefaults defaults;
  testing::TempDir dir;
  MyDocument document;
};

TEST_F(OfflineRendererTest, AFrameLandsWherePointsProjectWithTheirColoursAndDepth) {
  document.addLayer(layerOf({{48, 8, 255, 0, 0}, {10, 25, 0, 255, 0}, {32, 16, 10, 20, 200}}));
  auto r = renderer(true);
  ASSERT_TRUE(r);
  EXPECT_EQ(r->outputPattern().text(), "out_%04d.tiff");
  r->setOutputPattern(*FramePattern::parse("output_%04d.tiff"));
  Error error;
  ASSERT_TRUE(r->renderFrameOfDocumentForCamera(7, document, testCamera(), &error))
      << error.message;
  EXPECT_EQ(filesWritten(), (std::set<std::string>{"output_0007.tiff", "depth_output_0007.tiff"}));

  const auto colour = gl::readTiff(dir / "output_0007.tiff", &error);
  ASSERT_TRUE(colour) << error.message;
  EXPECT_EQ(colour->width, kWidth);
  EXPECT_EQ(colour->height, kHeight);
  EXPECT_EQ(colour->samplesPerPixel, 3);
  EXPECT_EQ(colour->bitsPerSample, 8);
  EXPECT_EQ(rgbAt(*colour, 48, 8), (std::array{255, 0, 0}));
  EXPECT_EQ(rgbAt(*colour, 10, 25), (std::array{0, 255, 0}));
  EXPECT_EQ(rgbAt(*colour, 32, 16), (std::array{10, 20, 200}));
  int drawn = 0;
  for (int y = 0; y < kHeight; ++y) {
    for (int x = 0; x < kWidth; ++x) {
      drawn += rgbAt(*colour, x, y) != std::array{0, 0, 0} ? 1 : 0;
    }
  }
  EXPECT_EQ(drawn, 3);

  // Window depth of a point at distance d between near n and far f:
  // (f + n) / (f - n) - 2fn / ((f - n) d), mapped from [-1, 1] to [0, 1].
  const auto depth = gl::readTiff(dir / "depth_output_0007.tiff", &error);
  ASSERT_TRUE(depth) << error.message;
  EXPECT_EQ(depth->samplesPerPixel, 1);
  EXPECT_EQ(depth->bitsPerSample, 16);
  const double ndc = 11.0 / 9.0 - 20.0 / (9.0 * kDistance);
  const double expected = (ndc + 1) / 2 * 65535;
  EXPECT_NEAR(depth->sample(48, 8, 0), expected, 3);
  EXPECT_NEAR(depth->sample(32, 16, 0), expected, 3);
  EXPECT_EQ(depth->sample(0, 0, 0), 65535);

  // The same frame drawn and read into memory, as a caller that wants the
  // pixels rather than files does.
  const gl::CurrentContext current(r->context());
  r->scene().setupFrustumForCamera(*testCamera());
  r->renderColorFrameOfDocumentForCamera(document, testCamera());
  gl::RgbaImage image;
  ASSERT_TRUE(r->readColorFrame(image));
  const auto* pixel = &image.pixels[(8 * kWidth + 48) * 4];
  EXPECT_EQ((std::array{pixel[0], pixel[1], pixel[2]}), (std::array<std::uint8_t, 3>{255, 0, 0}));
  // And saved file by file: the same bytes as the frame's own files.
  ASSERT_TRUE(r->saveColorFrame(dir / "again.tiff"));
  ASSERT_TRUE(r->saveDepthFrame(dir / "depth_again.tiff"));
  EXPECT_EQ(testing::readFile(dir / "again.tiff"), testing::readFile(dir / "output_0007.tiff"));
  EXPECT_EQ(testing::readFile(dir / "depth_again.tiff"),
            testing::readFile(dir / "depth_output_0007.tiff"));
}

TEST_F(OfflineRendererTest, AStereoPairShiftsTheFrustumAndWritesOnlyLeftAndRight) {
  document.addLayer(layerOf({{32, 16, 255, 255, 255}}));
  auto r = renderer(true);
  ASSERT_TRUE(r);
  // 0.5 × 75 / 150 = 0.25 near-plane units of a 4-unit-wide window: four
  // pixels of 64, the left eye's picture to the left, the right's to the
  // right.
  r->setIsStereoRender(true);
  r->setStereoSeparation(75.0f);
  ASSERT_TRUE(r->renderFrameOfDocumentForCamera(3, document, testCamera()));
  EXPECT_EQ(filesWritten(), (std::set<std::string>{"L_out_0003.tiff", "R_out_0003.tiff"}));
  const auto left = gl::readTiff(dir / "L_out_0003.tiff");
  const auto right = gl::readTiff(dir / "R_out_0003.tiff");
  ASSERT_TRUE(left && right);
  EXPECT_EQ(rgbAt(*left, 28, 16), (std::array{255, 255, 255}));
  EXPECT_EQ(rgbAt(*right, 36, 16), (std::array{255, 255, 255}));
  EXPECT_EQ(rgbAt(*left, 32, 16), (std::array{0, 0, 0}));
}

TEST_F(OfflineRendererTest, FailuresToMakeOrWriteAFrameAreToldAndTheRestStillWritten) {
  {
    const CapturedLog log;
    Error error;
    const auto context = document.sharedGLContext();
    ASSERT_TRUE(context);
    EXPECT_FALSE(OfflineGLRenderer::initWithSceneContextExportDepth(
        OpenGLScene::initWithWidthHeightFieldOfView(0, 0, 30.0), *context, false, &error));
    EXPECT_EQ(log.count("OpenGL Error: 0501 after init"), 1);
    EXPECT_FALSE(error.message.empty());
  }
  document.addLayer(layerOf({{1, 1, 255, 0, 0}}));
  auto r = renderer(true);
  ASSERT_TRUE(r);
  // The depth image's name is taken by a folder: the colour frame is still
  // written, and the failure named.
  fs::create_directory(dir / "depth_out_0001.tiff");
  Error error;
  EXPECT_FALSE(r->renderFrameOfDocumentForCamera(1, document, testCamera(), &error));
  EXPECT_NE(error.message.find("depth_out_0001.tiff"), std::string::npos) << error.message;
  EXPECT_TRUE(fs::is_regular_file(dir / "out_0001.tiff"));

  r->setOutputPath(dir / "gone");
  EXPECT_FALSE(r->renderFrameOfDocumentForCamera(2, document, testCamera(), &error));
  EXPECT_FALSE(fs::exists(dir / "gone"));
}

TEST_F(OfflineRendererTest, TheScreenshotGoesToTheSavePathWithTheNameAppendedAsIs) {
  document.addLayer(layerOf({{5, 6, 0, 0, 255}}));
  UserDefaults::standardUserDefaults().setObjectForKey((dir / "shots").string(), "KTImageSavePath");
  // What a view does: draw its frame, then capture it.
  const auto framebuffer = gl::Framebuffer::create(kWidth, kHeight);
  ASSERT_TRUE(framebuffer);
  const gl::FramebufferBinding binding(*framebuffer);
  const OpenGLScene scene = OpenGLScene::initWithWidthHeightFieldOfView(kWidth, kHeight, 30.0);
  scene.setupFrustumForCamera(*testCamera());
  glClear(GL_COLOR_BUFFER_BIT | GL_DEPTH_BUFFER_BIT);
  RenderOptions options;
  options.setSceneCamera(testCamera());
  document.drawContentWithOptions(options);

  const CapturedLog log;
  Error error;
  ASSERT_TRUE(scene.captureImageToFile("out.tiff", &error)) << error.message;
  EXPECT_EQ(log.count("Screenshot saved at " + (dir / "shotsout.tiff").string()), 1);
  const auto shot = gl::readTiff(dir / "shotsout.tiff");
  ASSERT_TRUE(shot);
  EXPECT_EQ(rgbAt(*shot, 5, 6), (std::array{0, 0, 255}));
}

TEST_F(OfflineRendererTest, ACameraPathRendersEachOfItsFramesIntoTheSavePath) {
  document.addLayer(layerOf({{32, 16, 255, 255, 255}}));
  UserDefaults::standardUserDefaults().setObjectForKey(dir.path().string(), "KTImageSavePath");
  // Three poses at the origin looking down -z.
  const auto path = ZXYCameraPath::initWithText("3\n0 0 0 0 0 0\n0 0 0 0 0 0\n0 0 0 0 0 0\n");
  ASSERT_TRUE(path);
  const CapturedLog log;
  EXPECT_EQ(renderCameraPathOfDocument(*path, document, 45.0, 1.0f, 30.0f), 3);
  EXPECT_EQ(filesWritten(),
            (std::set<std::string>{"out_0000.tiff", "out_0001.tiff", "out_0002.tiff"}));
  const auto frame = gl::readTiff(dir / "out_0002.tiff");
  ASSERT_TRUE(frame);
  EXPECT_EQ(frame->width, 720);
  EXPECT_EQ(frame->height, 480);
  // Three small frames take well under a second, counted in whole seconds
  // of the clock: the rate is infinite, unless a second began meanwhile.
  EXPECT_EQ(log.count("Rendered 3 frames in 0 seconds, FPS:inf") +
                log.count("Rendered 3 frames in 1 seconds, FPS:3.00"),
            1);
}

TEST(FramePattern, OnlyOneIntegerConversionIsAccepted) {
  for (const char* good : {"output_%04d.tiff", "%d", "f%%_%5i.tif", "%x.tiff", "a%-3u", "%.3d"}) {
    EXPECT_TRUE(FramePattern::parse(good)) << good;
  }
  for (const char* bad : {"", "frame.tiff", "%d_%d.tiff", "%s.tiff", "%n", "%*d", "%04", "%%",
                          "%ld.tiff", "%1000d", "%f"}) {
    Error error;
    EXPECT_FALSE(FramePattern::parse(bad, &error)) << bad;
    EXPECT_NE(error.message.find("pattern"), std::string::npos);
  }
  EXPECT_EQ(FramePattern::parse("output_%04d.tiff")->format(7), "output_0007.tiff");
  EXPECT_EQ(FramePattern::parse("100%%_%d")->format(12345), "100%_12345");
  EXPECT_EQ(FramePattern::parse("%x")->format(-1), "ffffffff");
  EXPECT_EQ(FramePattern().format(3), "out_0003.tiff");
}

TEST(RenderSheets, PresetsRangesAndProgress) {
  RenderPropertiesController sheet;
  EXPECT_EQ(sheet.width(), 1440);
  EXPECT_EQ(sheet.height(), 720);
  EXPECT_EQ(sheet.outputPattern().text(), "output_%04d.tiff");
  EXPECT_FLOAT_EQ(sheet.stereoSeparation(), 0.2f);
  sheet.setResolutionPreset(2);
  for (const int outside : {11, -1}) {
    sheet.setResolutionPreset(outside);
    EXPECT_EQ(sheet.width(), 720);
    EXPECT_EQ(sheet.height(), 480);
  }
  EXPECT_EQ(resolutionPresetNamed("wqhd"), 10);
  EXPECT_EQ(resolutionPresetNamed("PAL SQUARE PIXEL"), 3);
  EXPECT_FALSE(resolutionPresetNamed("720"));

  // The output folder is made when missing; a file in its place, no folder
  // or no pixels are refused with a message saying so.
  const testing::TempDir dir;
  sheet.setOutputPath((dir / "frames" / "today").string());
  Error error;
  EXPECT_TRUE(sheet.prepareForRender(&error)) << error.message;
  EXPECT_TRUE(fs::is_directory(dir / "frames" / "today"));
  EXPECT_TRUE(sheet.prepareForRender());
  testing::writeFile(dir / "taken", "x");
  struct Refusal {
    std::string folder;
    int width;
    const char* says;
  };
  for (const Refusal& r :
       {Refusal{(dir / "taken").string(), 720, "not a folder"},
        Refusal{(dir / "taken" / "sub").string(), 720, "cannot be made"},
        Refusal{"", 720, "Choose a folder"}, Refusal{dir.path().string(), 0, "no pixels"}}) {
    sheet.setOutputPath(r.folder);
    sheet.setWidth(r.width);
    EXPECT_FALSE(sheet.prepareForRender(&error)) << r.folder;
    EXPECT_NE(error.message.find(r.says), std::string::npos) << error.message;
  }

  RenderProgressController progress;
  // The sheet hears of each change as it happens, with the new values in place.
  std::vector<std::string> heard;
  progress.setChangeHandler(
      [&] { heard.push_back(progress.label() + (progress.hasCancelled() ? " cancelled" : "")); });
  progress.setProgressFrameLastFrame(3, 12);
  EXPECT_EQ(progress.label(), "frame 3 of 12");
  EXPECT_DOUBLE_EQ(progress.barValue(), 25.0);
  progress.setProgressFrameLastFrame(0, 0);
  EXPECT_DOUBLE_EQ(progress.barValue(), 100.0);
  progress.setProgress(0.42f);
  EXPECT_EQ(progress.label(), "42%");
  EXPECT_FALSE(progress.hasCancelled());
  progress.cancelButtonClicked();
  EXPECT_TRUE(progress.hasCancelled());
  EXPECT_EQ(heard,
            (std::vector<std::string>{"frame 3 of 12", "frame 0 of 0", "42%", "42% cancelled"}));
  progress.setChangeHandler(nullptr);
  progress.setProgress(0.5f);
  EXPECT_EQ(heard.size(), 4u);
}

}  // namespace
}  // namespace cloudreel
