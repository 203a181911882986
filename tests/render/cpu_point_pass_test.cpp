// Frames whose points are placed on the CPU against the same frames drawn
// through OpenGL: colour and the full 32-bit depth buffer byte for byte, for
// clouds that reach past every side of the view and both clipping planes,
// at several point sizes and layer transforms, with plain colours, the luck
// limit, layers drawn through OpenGL between point layers, stereo pairs and
// depth images. The generated points lie at random depths, so two of them
// never meet at exactly the same depth in one pixel.
#include "render/cpu_point_pass.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <memory>
#include <random>
#include <vector>

#include "camera/camera.h"
#include "geometry/affine_transform.h"
#include "platform/color.h"
#include "render/gl/gl_context.h"
#include "render/offline_gl_renderer.h"
#include "render/point_rasterizer.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"
#include "scene/sphere.h"
#include "support/memory_defaults.h"
#include "support/pixel_harness.h"

namespace cloudreel {
namespace {

constexpr int kWidth = 200;
constexpr int kHeight = 150;

std::shared_ptr<Camera> testCamera() {
  auto camera = std::make_shared<Camera>();
  camera->setFieldOfView(50.0f);
  camera->setZNear(1.0f);
  camera->setZFar(12.0f);
  return camera;
}

// Points in a box around the camera's view, from behind the eye to past the
// far plane and wider than the view on every side.
std::shared_ptr<PointLayer> cloud(std::int32_t count, unsigned seed) {
  std::mt19937 random(seed);
  std::uniform_real_distribution<float> across(-9.0f, 9.0f);
  std::uniform_real_distribution<float> deep(-16.0f, 1.0f);
  std::uniform_int_distribution<int> byte(0, 255);
  auto layer = std::make_shared<PointLayer>();
  layer->allocatePointArrayWithSize(count);
  layer->setNPoints(count);
  for (std::int32_t i = 0; i < count; ++i) {
    layer->colorPoints()[i] = {across(random),
                               across(random) * 0.75f,
                               deep(random),
                               static_cast<std::uint8_t>(byte(random)),
                               static_cast<std::uint8_t>(byte(random)),
                               static_cast<std::uint8_t>(byte(random)),
                               static_cast<std::uint8_t>(byte(random) % 255)};
  }
  layer->setPointSize(1.0f);
  return layer;
}

std::shared_ptr<AffineTransform> skewedPlacement() {
  auto t = AffineTransform::initWithAxisAngleRotation({0.3, 1.0, 0.2, 0.41});
  t->setScale(1.17);
  t->setTranslation({0.31, -0.27, -0.9});
  return t;
}

struct Frame {
  std::vector<gl::RgbaImage> colour;
  gl::DepthImage depthImage;
  // The last view's depth buffer as the renderer holds it.
  std::vector<std::uint32_t> depth;
  std::size_t pointsOnCpu = 0;
};

class CpuPointPassTest : public testing::PixelTest {
 protected:
  Frame render(PointRasterization mode, bool depth = false, bool stereo = false) {
    Frame frame;
    const auto context = document.sharedGLContext();
    if (!context) {
      ADD_FAILURE() << "no context";
      return frame;
    }
    auto renderer = OfflineGLRenderer::initWithSceneContextExportDepth(
        OpenGLScene::initWithWidthHeightFieldOfView(kWidth, kHeight, 50.0), *context, depth);
    if (!renderer) {
      ADD_FAILURE() << "no renderer";
      return frame;
    }
    renderer->setPointRasterization(mode);
    renderer->setIsStereoRender(stereo);
    renderer->setStereoSeparation(3.0f);
    auto drawn = renderer->drawFrameOfDocumentForCamera(0, document, testCamera());
    EXPECT_FALSE(drawn.failed) << drawn.error.message;
    for (auto& file : drawn.colour) {
      frame.colour.push_back(std::move(file.image));
    }
    if (drawn.depth) {
      frame.depthImage = std::move(drawn.depth->image);
    }
    frame.pointsOnCpu = renderer->pointsDrawnOnCpu();
    const gl::CurrentContext current(renderer->context());
    EXPECT_TRUE(renderer->completeFramebuffer());
    frame.depth.resize(static_cast<std::size_t>(kWidth * kHeight));
    glReadPixels(0, 0, kWidth, kHeight, GL_DEPTH_COMPONENT, GL_UNSIGNED_INT, frame.depth.data());
    return frame;
  }

  // Renders both ways and compares; answers how many points the CPU frame
  // took, so that a test can tell the CPU really drew them.
  std::size_t expectSameFrames(bool depth = false, bool stereo = false) {
    // Some layers draw nothing in the frame that builds their drawing (a
    // primitive's first frame): a first frame builds them all.
    render(PointRasterization::OpenGL, depth, stereo);
    const Frame cpu = render(PointRasterization::Cpu, depth, stereo);
    const Frame gl = render(PointRasterization::OpenGL, depth, stereo);
    EXPECT_EQ(gl.pointsOnCpu, 0u);
    EXPECT_EQ(gl.colour.size(), cpu.colour.size());
    for (std::size_t view = 0; view < std::min(gl.colour.size(), cpu.colour.size()); ++view) {
      const auto& a = gl.colour[view].pixels;
      const auto& b = cpu.colour[view].pixels;
      EXPECT_EQ(a.size(), b.size());
      std::size_t differing = 0;
      for (std::size_t i = 0; i < std::min(a.size(), b.size()); ++i) {
        differing += a[i] != b[i] ? 1 : 0;
      }
      EXPECT_EQ(differing, 0u) << "colour bytes differ in view " << view;
    }
    std::size_t differingDepth = 0;
    for (std::size_t i = 0; i < gl.depth.size(); ++i) {
      differingDepth += gl.depth[i] != cpu.depth[i] ? 1 : 0;
    }
    EXPECT_EQ(differingDepth, 0u) << "depth values differ";
    EXPECT_EQ(gl.depthImage.values, cpu.depthImage.values);
    return cpu.pointsOnCpu;
  }

  testing::MemoryDefaults defaults;
  MyDocument document;
};

TEST_F(CpuPointPassTest, CloudsMatchOpenGLAtEveryPointSizeAndPlacement) {
  auto layer = cloud(60000, 7);
  document.addLayer(layer);
  for (const float size : {1.0f, 2.0f, 3.0f, 6.0f}) {
    for (const bool placed : {false, true}) {
      SCOPED_TRACE(::testing::Message() << "size " << size << (placed ? ", placed" : ""));
      layer->setPointSize(size);
      layer->setObjectToWorld(placed ? skewedPlacement() : AffineTransform::initWithScale(1.0));
      EXPECT_EQ(expectSameFrames(), 60000u);
    }
  }
}

TEST_F(CpuPointPassTest, PlainColoursTheLuckLimitAndLayersDrawnThroughOpenGLKeepTheirOrder) {
  auto plain = cloud(20000, 11);
  plain->setColorMode(1);
  plain->setFixedColor(Color::colorWithRGBA(0.5f, 1.0f / 3.0f, 0.998f, 1.0f));
  plain->setBucketLimit(0.5f);
  auto translucent = cloud(20000, 12);
  translucent->setOpacity(0.5f);
  auto sphere = std::make_shared<Sphere>();
  sphere->setObjectToWorld(AffineTransform::initWithTranslation({0.5, 0.2, -5.0}));
  auto last = cloud(20000, 13);
  last->setPointSize(2.0f);
  for (const auto& layer : std::vector<std::shared_ptr<Layer>>{plain, translucent, sphere, last}) {
    document.addLayer(layer);
  }
  // The translucent layer and the sphere go through OpenGL between the two
  // clouds the CPU draws.
  EXPECT_EQ(expectSameFrames(), 40000u);
  // A colour mode that draws nothing is nothing either way.
  plain->setColorMode(2);
  expectSameFrames();
}

TEST_F(CpuPointPassTest, StereoPairsAndDepthImagesMatch) {
  auto layer = cloud(40000, 21);
  layer->setObjectToWorld(skewedPlacement());
  document.addLayer(layer);
  EXPECT_EQ(expectSameFrames(false, true), 40000u);
  EXPECT_EQ(expectSameFrames(true, false), 40000u);
}

TEST_F(CpuPointPassTest, LayersTheCpuCannotDrawExactlyGoThroughOpenGL) {
  auto layer = cloud(5000, 31);
  document.addLayer(layer);
  const auto onCpu = [&] { return render(PointRasterization::Cpu).pointsOnCpu; };
  EXPECT_EQ(onCpu(), 5000u);
  layer->setPointSize(1.5f);
  EXPECT_EQ(onCpu(), 0u);
  layer->setPointSize(1.0f);
  layer->setAntialias(true);
  EXPECT_EQ(onCpu(), 0u);
  layer->setAntialias(false);
  layer->setEnableFog(true);
  EXPECT_EQ(onCpu(), 0u);
  layer->setEnableFog(false);
  layer->setOpacity(0.9f);
  layer->invalidateOpenGLDisplayLists();
  EXPECT_EQ(onCpu(), 0u);
  layer->setOpacity(1.0f);
  layer->setDrawMode(1);
  EXPECT_EQ(onCpu(), 0u);
  layer->setDrawMode(0);
  EXPECT_EQ(onCpu(), 5000u);
}

TEST_F(CpuPointPassTest, ARendererSwitchedToOpenGLShowsItsOwnFrame) {
  auto layer = cloud(5000, 41);
  document.addLayer(layer);
  const auto context = document.sharedGLContext();
  ASSERT_TRUE(context);
  auto renderer = OfflineGLRenderer::initWithSceneContextExportDepth(
      OpenGLScene::initWithWidthHeightFieldOfView(kWidth, kHeight, 50.0), *context, false);
  ASSERT_TRUE(renderer);
  renderer->setPointRasterization(PointRasterization::Cpu);
  auto drawn = renderer->drawFrameOfDocumentForCamera(0, document, testCamera());
  EXPECT_EQ(renderer->pointsDrawnOnCpu(), 5000u);
  // The next frame has nothing in it: no point of the last one may remain.
  layer->setIsVisible(false);
  renderer->setPointRasterization(PointRasterization::OpenGL);
  drawn = renderer->drawFrameOfDocumentForCamera(1, document, testCamera());
  ASSERT_EQ(drawn.colour.size(), 1u);
  const auto& pixels = drawn.colour[0].image.pixels;
  EXPECT_EQ(std::count(pixels.begin(), pixels.end(), 0), static_cast<long>(pixels.size()));
  EXPECT_EQ(renderer->pointsDrawnOnCpu(), 0u);
}

TEST(PointRasterizer, ThreadsShareTheWorkWithoutChangingTheFrame) {
  // Large points straddle the bands of rows the threads write; the frame is
  // the same on one thread and on several.
  std::mt19937 random(5);
  std::uniform_real_distribution<float> unit(-1.2f, 1.2f);
  std::vector<std::uint8_t> records(16 * 100000);
  for (std::size_t i = 0; i < records.size(); i += 16) {
    const float xyz[3] = {unit(random), unit(random), unit(random)};
    std::memcpy(&records[i], xyz, sizeof xyz);
    for (int c = 12; c < 16; ++c) {
      records[i + c] = static_cast<std::uint8_t>(random() % 250);
    }
  }
  PointRasterBatch batch;
  batch.projection = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1};
  batch.modelView = batch.projection;
  batch.viewport = {0, 0, 97, 61};
  batch.records = records.data();
  batch.count = records.size() / 16;
  batch.luckThreshold = 255;
  batch.pointSize = 9;
  const auto drawOn = [&](unsigned threads) {
    std::vector<std::uint32_t> colour(97 * 61, 0), depth(97 * 61, 0xffffffffu);
    // Small chunks: many rounds of projecting and writing.
    PointRasterizer rasterizer({threads, 1, 1000});
    EXPECT_TRUE(rasterizer.draw({97, 61, colour.data(), depth.data()}, {&batch, 1}));
    colour.insert(colour.end(), depth.begin(), depth.end());
    return colour;
  };
  const auto one = drawOn(1);
  EXPECT_EQ(drawOn(3), one);
  EXPECT_EQ(drawOn(8), one);
}

}  // namespace
}  // namespace cloudreel
