// Point layers drawn into real pixels: which points the luck threshold lets
// through, when the cached drawing is rebuilt, and how the draw and colour
// modes, normals and the bounding box show.
#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <limits>
#include <vector>

#include "platform/error.h"
#include "render/render_options.h"
#include "scene/point_layer.h"
#include "support/pixel_harness.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

using testing::Frame;
using testing::Rgba;

constexpr int kSize = 64;

// The world position of a pixel's centre under the harness projection.
std::array<float, 2> centreOf(int px, int py) {
  return {static_cast<float>(px - kSize / 2) + 0.5f, static_cast<float>(kSize / 2 - py) - 0.5f};
}

struct Dot {
  int px, py;
  std::uint8_t r, g, b, luck;
};

std::shared_ptr<PointLayer> layerOf(const std::vector<Dot>& dots) {
  auto layer = std::make_shared<PointLayer>();
  const auto n = static_cast<std::int32_t>(dots.size());
  layer->allocatePointArrayWithSize(n);
  layer->setNPoints(n);
  for (std::size_t i = 0; i < dots.size(); ++i) {
    const auto [x, y] = centreOf(dots[i].px, dots[i].py);
    layer->colorPoints()[i] = {x, y, 0.0f, dots[i].r, dots[i].g, dots[i].b, dots[i].luck};
  }
  layer->setPointSize(1.0f);
  layer->setFixedColor(std::make_shared<Color>(0.0f, 0.0f, 1.0f));
  return layer;
}

class PointDrawingTest : public testing::PixelTest {
 protected:
  Frame draw(PointLayer& layer, const RenderOptions& options = {}) {
    return render(kSize, kSize, [&] { layer.drawGLWithOptions(options); });
  }
};

TEST_F(PointDrawingTest, TheLuckThresholdDrawsExactlyThePointsBelowIt) {
  // One point per luck value of interest, each in a pixel of its own.
  const std::vector<std::uint8_t> lucks = {0, 62, 63, 126, 127, 254, 255};
  std::vector<Dot> dots;
  for (std::size_t i = 0; i < lucks.size(); ++i) {
    dots.push_back({static_cast<int>(4 + 8 * i), 10, 255, 0, 0, lucks[i]});
  }
  auto layer = layerOf(dots);
  const float nan = std::numeric_limits<float>::quiet_NaN();

  struct Case {
    float limit;
    bool overrideOn;
    Value global;
    std::int32_t threshold;
  };
  const Case cases[] = {
      {0.5f, false, {}, 127},   {1.0f, false, {}, 255},   {1.004f, false, {}, 256},
      {0.0f, false, {}, 0},     {-1.0f, false, {}, -255}, {1e20f, false, {}, 2147483647},
      {nan, false, {}, 0},      {1.0f, true, 0.25f, 63},  {1.0f, true, 0.25, 63},
      {0.25f, false, 1.0f, 63}, {1.0f, true, {}, 0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(::testing::Message() << "limit " << c.limit << " override " << c.overrideOn);
    layer->setBucketLimit(c.limit);
    RenderOptions options;
    if (c.overrideOn) {
      options.setValueForKey(true, kRenderOptionBucketOverride);
    }
    options.setValueForKey(c.global, kRenderOptionBucketGlobal);
    EXPECT_EQ(layer->luckThresholdForOptions(options), c.threshold);

    const Frame frame = draw(*layer, options);
    EXPECT_EQ(layer->displayListBuckets(), c.threshold);
    for (std::size_t i = 0; i < dots.size(); ++i) {
      const bool drawn = frame.at(dots[i].px, dots[i].py) != testing::kBlack;
      EXPECT_EQ(drawn, lucks[i] < c.threshold) << "luck " << int{lucks[i]};
    }
    EXPECT_EQ(frame.countDrawn(),
              static_cast<int>(std::count_if(lucks.begin(), lucks.end(),
                                             [&](std::uint8_t l) { return l < c.threshold; })));
  }
}

TEST_F(PointDrawingTest, OnlyATriggerRebuildsTheDrawingAndWithItTheBakedState) {
  auto layer = layerOf({{10, 10, 200, 100, 50, 10}, {20, 20, 10, 20, 30, 127}});
  const auto alphaAt = [&](const Frame& frame) { return frame.at(10, 10).a; };

  layer->setBucketLimit(0.500f);
  EXPECT_EQ(alphaAt(draw(*layer)), 255);
  // Opacity is baked into the drawing: alone it changes nothing.
  layer->setOpacity(0.5f);
  EXPECT_EQ(alphaAt(draw(*layer)), 255);
  // 0.501 still gives threshold 127: no rebuild.
  layer->setBucketLimit(0.501f);
  EXPECT_EQ(alphaAt(draw(*layer)), 255);
  // 0.505 gives 128: rebuilt, so the new opacity shows (trunc(0.5 × 255)),
  // and the point of luck 127 is drawn.
  layer->setBucketLimit(0.505f);
  Frame frame = draw(*layer);
  EXPECT_EQ(frame.at(10, 10), (Rgba{200, 100, 50, 127}));
  EXPECT_EQ(frame.at(20, 20), (Rgba{10, 20, 30, 127}));

  // Attenuation is baked too; the explicit invalidation shows it.
  layer->setPointSize(8.0f);
  const int full = draw(*layer).countDrawn();
  layer->setAttenuatePoints(true);
  layer->setAtten_a(4.0f);
  layer->setAtten_c(0.0f);
  EXPECT_EQ(draw(*layer).countDrawn(), full);
  layer->invalidateOpenGLDisplayLists();
  EXPECT_FALSE(layer->hasPointDrawing());
  EXPECT_EQ(draw(*layer).countDrawn(), 2 * 4 * 4);  // 8 / sqrt(4) = 4 pixels wide

  // Records rewritten in place show once the drawing is rebuilt.
  layer->reRandomizeWithExponent(0.0f);  // every luck 255: never drawn below 1.004
  layer->invalidateOpenGLDisplayLists();
  EXPECT_EQ(draw(*layer).countDrawn(), 0);
}

TEST_F(PointDrawingTest, ColourModesAndTheBoundingBox) {
  auto layer = layerOf({{20, 20, 200, 100, 50, 0}});
  layer->setOpacity(0.5f);
  layer->setColorMode(1);
  // The fixed colour, opaque whatever the opacity.
  EXPECT_EQ(draw(*layer).at(20, 20), (Rgba{0, 0, 255, 255}));

  layer->setColorMode(2);
  EXPECT_EQ(draw(*layer).countDrawn(), 0);
  EXPECT_TRUE(layer->hasPointDrawing());

  // The box shows in editor frames even for a hidden layer, and never in a
  // rendered frame.
  layer->setIsVisible(false);
  layer->setDrawBoundingBox(true);
  layer->setBoundingBox({-9.5, -9.5, -1, 9.5, 9.5, 1});  // on pixel centres
  RenderOptions editor;
  editor.setValueForKey(true, kRenderOptionEditor);
  const Frame boxed = render(kSize, kSize, [&] { layer->drawContentWithOptions(editor); });
  EXPECT_EQ(boxed.at(22, 32), testing::kWhite);
  EXPECT_EQ(boxed.at(kSize / 2, kSize / 2), testing::kBlack);
  EXPECT_TRUE(layer->hasBoundingBoxDrawing());
  const Frame rendered = render(kSize, kSize, [&] { layer->drawContentWithOptions({}); });
  EXPECT_EQ(rendered.countDrawn(), 0);
}

TEST_F(PointDrawingTest, MeshesIgnoreLuckUnlessPointsOnlyAndSpheresWinOverTheMesh) {
  // A triangle of white points of luck 255, 0.2 units across, seen 200
  // times enlarged so that the spheres (radius 0.015) are 3 pixels wide.
  auto layer = std::make_shared<PointLayer>();
  layer->allocatePointArrayWithSize(3);
  layer->setNPoints(3);
  const float corners[3][2] = {{-0.1f, -0.1f}, {0.1f, -0.1f}, {0.0f, 0.1f}};
  for (int i = 0; i < 3; ++i) {
    layer->colorPoints()[i] = {corners[i][0], corners[i][1], 0.0f, 255, 255, 255, 255};
  }
  layer->setPointSize(1.0f);
  // The second face names a point the array does not hold: skipped.
  layer->setTriangles({0, 1, 2, 0, 1, 7});
  const auto drawn = [&] {
    return render(kSize, kSize,
                  [&] {
                    glScalef(200.0f, 200.0f, 200.0f);
                    layer->drawGLWithOptions({});
                  })
        .countDrawn();
  };
  EXPECT_GT(drawn(), 600);  // the whole triangle, whatever the luck

  layer->setDrawPointsOnly(true);
  layer->invalidateOpenGLDisplayLists();
  EXPECT_EQ(drawn(), 0);  // as points, luck 255 is hidden at limit 1
  layer->setBucketLimit(2.0f);
  EXPECT_EQ(drawn(), 3);

  layer->setDrawPointsOnly(false);
  layer->setDrawMode(1);
  const int spheres = drawn();
  EXPECT_GT(spheres, 3 * 20);  // three discs of radius 3, not the mesh
  EXPECT_LT(spheres, 3 * 40);
}

// A point file of red points with normals: records of 28 bytes.
std::filesystem::path writeLitPointFile(const std::filesystem::path& path,
                                        const std::vector<std::array<float, 6>>& points) {
  std::string bytes(88, '\0');
  std::memcpy(bytes.data(), "RWBP", 4);
  const auto n = static_cast<std::uint32_t>(points.size());
  std::memcpy(bytes.data() + 12, &n, 4);
  bytes[24] = 1;
  for (const auto& p : points) {
    char record[28] = {};
    std::memcpy(record, p.data(), 24);
    record[24] = char(200);
    bytes.append(record, 28);
  }
  return testing::writeFile(path, bytes);
}

TEST_F(PointDrawingTest, PointsWithNormalsAreLitInTheirOwnColour) {
  testing::TempDir dir;
  const auto [x0, y0] = centreOf(10, 10);
  const auto [x1, y1] = centreOf(20, 20);
  PointLayer layer;
  Error error;
  ASSERT_FALSE(layer.loadPointsFromURLError(
      writeLitPointFile(dir / "lit.rwb", {{x0, y0, 0, 0, 0, 3}, {x1, y1, 0, 0, 0, -1}}), &error));
  layer.setPointSize(1.0f);
  const Frame frame = render(kSize, kSize, [&] {
    glEnable(GL_LIGHT0);  // white, from +z
    layer.drawGLWithOptions({});
  });
  // Facing the light (the normal rescaled to unit length): full diffuse red;
  // facing away: only the ambient part.
  EXPECT_TRUE(testing::pixelIs(frame, 10, 10, Rgba{210, 10, 10, 255}, 2));
  EXPECT_TRUE(testing::pixelIs(frame, 20, 20, Rgba{10, 0, 0, 255}, 10));
}

}  // namespace
}  // namespace cloudreel
