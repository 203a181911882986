// The ocean layer: what it archives and copies, how the timeline and the
// document drive it, and what it draws in real pixels.
#include "scene/ocean_fft.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <string>
#include <vector>

#include "render/render_options.h"
#include "scene/archive_helpers.h"
#include "scene/my_document.h"
#include "support/pixel_harness.h"
#include "timeline/timeline_track.h"

namespace cloudreel {
namespace {

using testing::Box;
using testing::Frame;
using testing::Rgba;

// The surface's positions and normals at the ocean's time, as bytes, so
// that two surfaces compare exactly.
std::vector<std::uint8_t> surfaceBytes(OceanFFT& ocean) {
  ocean.updateSurface();
  const std::span<color_point> records = ocean.colorPoints();
  std::vector<std::uint8_t> bytes(records.size_bytes() + ocean.normals().size() * sizeof(float));
  if (!records.empty()) {
    std::memcpy(bytes.data(), records.data(), records.size_bytes());
  }
  if (!ocean.normals().empty()) {
    std::memcpy(bytes.data() + records.size_bytes(), ocean.normals().data(),
                ocean.normals().size() * sizeof(float));
  }
  return bytes;
}

std::shared_ptr<OceanFFT> smallOcean() {
  auto ocean = std::make_shared<OceanFFT>();
  ocean->setGridSize(64);
  ocean->setPatchSize(40.0f);
  ocean->setSeed(7);
  ocean->setTime(1.25f);
  return ocean;
}

TEST(OceanFFT, ArchivesItsParametersAndNotItsMeshAndComesBackIdentical) {
  const auto ocean = smallOcean();
  ocean->setWindSpeed(11.0f);
  ocean->setWindDirection(40.0f);
  ocean->setAmplitude(0.003f);
  ocean->setChoppiness(0.5f);
  ocean->setDrawWireFrame(true);
  const std::vector<std::uint8_t> surface = surfaceBytes(*ocean);
  ASSERT_EQ(ocean->nPoints(), 64 * 64);
  ASSERT_EQ(ocean->nFaces(), 2 * 63 * 63);

  const Bytes archived = KeyedArchiver::archivedDataWithRootObject(ocean);
  // 4,096 records would take 64 KiB; the parameters take a few hundred
  // bytes.
  EXPECT_LT(archived.size(), 8000u);
  const auto back = testing::decodeAs<OceanFFT>(archived);
  ASSERT_TRUE(back);
  EXPECT_EQ(back->gridSize(), 64);
  EXPECT_EQ(back->seed(), 7);
  EXPECT_FLOAT_EQ(back->windDirection(), 40.0f);
  EXPECT_FLOAT_EQ(back->choppiness(), 0.5f);
  EXPECT_TRUE(back->drawWireFrame());
  EXPECT_EQ(surfaceBytes(*back), surface);
}

TEST(OceanFFT, ValuesOutOfRangeFromADocumentOrASetterAreBroughtIntoIt) {
  const float nan = std::numeric_limits<float>::quiet_NaN();
  const auto back = testing::decodeFrom<OceanFFT>("OceanFFT", [&](KeyedArchiver& coder) {
    coder.encodeInt32(100, "gridSize");
    coder.encodeFloat(-5.0f, "windSpeed");
    coder.encodeFloat(nan, "patchSize");
    coder.encodeFloat(std::numeric_limits<float>::infinity(), "time");
  });
  ASSERT_TRUE(back);
  EXPECT_EQ(back->gridSize(), 128);
  EXPECT_EQ(back->windSpeed(), 0.0f);
  EXPECT_EQ(back->patchSize(), 0.0f);
  EXPECT_EQ(back->time(), 0.0f);
  // A calm sea on a tile of no size is flat and finite, not not-a-number.
  back->updateSurface();
  for (const color_point& p : back->colorPoints()) {
    ASSERT_TRUE(std::isfinite(p.x) && std::isfinite(p.y) && std::isfinite(p.z));
  }
  // Missing keys read as a new ocean's values.
  const auto older = testing::decodeFrom<OceanFFT>("OceanFFT", [](KeyedArchiver&) {});
  ASSERT_TRUE(older);
  EXPECT_EQ(older->gridSize(), OceanFFT().gridSize());
  EXPECT_EQ(older->amplitude(), OceanFFT().amplitude());

  OceanFFT ocean;
  for (const auto& [asked, kept] : {std::pair{4096, 512}, {-3, 64}, {200, 256}, {90, 64}}) {
    ocean.setGridSize(asked);
    EXPECT_EQ(ocean.gridSize(), kept) << asked;
  }
}

TEST(OceanFFT, ACopyComputesItsOwnSurfaceFromTheSameParameters) {
  const auto ocean = smallOcean();
  const std::vector<std::uint8_t> surface = surfaceBytes(*ocean);
  const auto copy = std::static_pointer_cast<OceanFFT>(ocean->copy());
  EXPECT_EQ(copy->name(), "Ocean copy");
  EXPECT_EQ(surfaceBytes(*copy), surface);
  EXPECT_NE(copy->points(), ocean->points());
  // Moving the copy on in time leaves the original's records alone.
  copy->setTime(3.0f);
  EXPECT_NE(surfaceBytes(*copy), surface);
  EXPECT_EQ(surfaceBytes(*ocean), surface);
}

TEST(OceanFFT, TheTimelineMovesTheWavesAndParameterEditsAreUndoable) {
  MyDocument document;
  const auto ocean = smallOcean();
  document.addLayer(ocean);
  document.undoManager().closeEventGroup();

  std::vector<std::shared_ptr<TimelineTrack>> tracks;
  ocean->getAnimatablePropsInArray(tracks);
  std::vector<std::string> titles;
  for (const auto& track : tracks) {
    titles.push_back(track->title());
  }
  EXPECT_EQ(titles,
            (std::vector<std::string>{"Transform", "Time", "Wind Speed", "Amplitude", "Choppiness"}));

  const std::vector<std::uint8_t> before = surfaceBytes(*ocean);
  tracks[1]->applyEffectForTime(2.5f);
  EXPECT_FLOAT_EQ(ocean->time(), 2.5f);
  EXPECT_NE(surfaceBytes(*ocean), before);
  tracks[1]->applyEffectForTime(1.25f);
  EXPECT_EQ(surfaceBytes(*ocean), before);

  ocean->setWindSpeed(15.0f);
  document.undoManager().closeEventGroup();
  EXPECT_EQ(document.undoManager().undoActionName(), "Change Wind Speed");
  EXPECT_NE(surfaceBytes(*ocean), before);
  document.undoManager().undo();
  EXPECT_FLOAT_EQ(ocean->windSpeed(), OceanFFT().windSpeed());
  EXPECT_EQ(surfaceBytes(*ocean), before);
}

using OceanDrawingTest = testing::PixelTest;

// Draws the ocean seen from straight above (+y towards the viewer), lit
// from above, one unit a pixel.
Frame fromAbove(OceanFFT& ocean) {
  return testing::renderFrame(300, 300, [&] {
    const GLfloat light[4] = {0.3f, 0.2f, 1.0f, 0.0f};
    glEnable(GL_LIGHT0);
    glLightfv(GL_LIGHT0, GL_POSITION, light);
    glRotatef(90.0f, 1.0f, 0.0f, 0.0f);
    ocean.drawGLWithOptions(RenderOptions());
  });
}

TEST_F(OceanDrawingTest, ALitSurfaceInItsColourThatMovesWithTimeAndShowsAsLinesInWireframe) {
  OceanFFT ocean;
  ocean.setGridSize(64);
  ocean.setPatchSize(280.0f);
  ocean.setChoppiness(0.0f);
  ocean.setFixedColor(Color::colorWithRGBA(0.1f, 0.3f, 0.9f, 1.0f));
  const Frame calm = fromAbove(ocean);
  // The tile covers the middle 280 × 280 pixels (less the last cell of
  // the grid), and nothing else.
  const Box tile{16, 16, 284, 284};
  EXPECT_EQ(calm.countDrawn(testing::kBlack, 0, tile), tile.width() * tile.height());
  EXPECT_EQ(calm.countDrawn(), calm.countDrawn(testing::kBlack, 0, Box{6, 6, 294, 294}));
  // Blue above all, and shaded: the slopes face the light differently.
  EXPECT_EQ(calm.count([](Rgba c) { return c.b > c.g && c.g > c.r; }, tile),
            tile.width() * tile.height());
  int darkest = 255, brightest = 0;
  for (int y = tile.top; y < tile.bottom; ++y) {
    for (int x = tile.left; x < tile.right; ++x) {
      darkest = std::min<int>(darkest, calm.at(x, y).b);
      brightest = std::max<int>(brightest, calm.at(x, y).b);
    }
  }
  EXPECT_GT(brightest - darkest, 20);

  ocean.setTime(2.0f);
  const Frame later = fromAbove(ocean);
  int changed = 0;
  for (int y = tile.top; y < tile.bottom; ++y) {
    for (int x = tile.left; x < tile.right; ++x) {
      changed += later.at(x, y) == calm.at(x, y) ? 0 : 1;
    }
  }
  EXPECT_GT(changed, tile.width() * tile.height() / 4);

  ocean.setDrawWireFrame(true);
  const Frame lines = fromAbove(ocean);
  EXPECT_GT(lines.countDrawn(testing::kBlack, 0, tile), 0);
  EXPECT_LT(lines.countDrawn(testing::kBlack, 0, tile), tile.width() * tile.height());
}

}  // namespace
}  // namespace cloudreel
