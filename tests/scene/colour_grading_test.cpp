// Colour grading of point layers: the grade of known colours, previews that
// never accumulate, and cancel, commit and undo that give back the exact
// original colours.
#include "scene/colour_grading.h"

#include <gtest/gtest.h>

#include <array>
#include <limits>
#include <vector>

#include "scene/my_document.h"
#include "scene/point_layer.h"
#include "support/memory_defaults.h"

namespace cloudreel {
namespace {

using Rgb = std::array<std::uint8_t, 3>;

TEST(ColourGrader, GradesKnownColours) {
  const float nan = std::numeric_limits<float>::quiet_NaN();
  struct Case {
    ColourGrade grade;
    Rgb in;
    Rgb out;
  };
  const Case cases[] = {
      {{}, {10, 128, 250}, {10, 128, 250}},
      // Brightness adds: half of full scale lifts black to 128 and clips.
      {{0.5f, 1, 1, 1}, {0, 200, 255}, {128, 255, 255}},
      {{-1.0f, 1, 1, 1}, {0, 200, 255}, {0, 0, 0}},
      // Contrast 0 flattens everything to the middle; 2 spreads from it.
      {{0, 0.0f, 1, 1}, {0, 77, 255}, {128, 128, 128}},
      {{0, 2.0f, 1, 1}, {0, 32, 255}, {0, 0, 255}},
      // Saturation 0 leaves the Rec. 709 luma of each primary.
      {{0, 1, 0.0f, 1}, {255, 0, 0}, {54, 54, 54}},
      {{0, 1, 0.0f, 1}, {0, 255, 0}, {182, 182, 182}},
      {{0, 1, 0.0f, 1}, {0, 0, 255}, {18, 18, 18}},
      {{0, 1, 2.0f, 1}, {100, 100, 100}, {100, 100, 100}},
      {{0, 1, 2.0f, 1}, {255, 0, 0}, {255, 0, 0}},
      // Gamma 2 is the square root: a quarter becomes a half.
      {{0, 1, 1, 2.0f}, {0, 64, 255}, {0, 128, 255}},
      {{0, 1, 1, 0.5f}, {0, 128, 255}, {0, 64, 255}},
      // Values outside the ranges are clamped, a NaN is neutral: a gamma of
      // 0 divides by nothing.
      {{nan, nan, nan, nan}, {1, 2, 3}, {1, 2, 3}},
      {{0, 1, 1, 0.0f}, {0, 128, 255}, {0, 0, 255}},
      {{5.0f, 1, 1, 1}, {0, 0, 0}, {255, 255, 255}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(::testing::Message() << c.grade.brightness << " " << c.grade.contrast << " "
                                      << c.grade.saturation << " " << c.grade.gamma);
    EXPECT_EQ(ColourGrader(c.grade).grade(c.in[0], c.in[1], c.in[2]), c.out);
  }
  EXPECT_TRUE((ColourGrade{nan, 1, 1, 1}).isIdentity());
  EXPECT_FALSE((ColourGrade{0, 1, 1.5f, 1}).isIdentity());
}

// Enough points that grading is shared among threads on a multi-core
// machine, with every colour and luck byte in use.
std::shared_ptr<PointLayer> rainbowLayer(int n) {
  auto layer = std::make_shared<PointLayer>();
  layer->allocatePointArrayWithSize(n);
  layer->setNPoints(n);
  for (int i = 0; i < n; ++i) {
    layer->colorPoints()[static_cast<std::size_t>(i)] = {static_cast<float>(i),
                                                         0.5f,
                                                         -1.0f,
                                                         static_cast<std::uint8_t>(i),
                                                         static_cast<std::uint8_t>(i / 256),
                                                         static_cast<std::uint8_t>(i * 7),
                                                         static_cast<std::uint8_t>(i * 3)};
  }
  return layer;
}

std::vector<std::uint8_t> bytesOf(const PointLayer& layer) {
  return {layer.points(), layer.points() + layer.pointArray()->size()};
}

constexpr int kManyPoints = 600'000;

TEST(ColourGradingSession, PreviewsDoNotAccumulateAndCancelRestoresExactly) {
  testing::MemoryDefaults defaults;
  auto layer = rainbowLayer(kManyPoints);
  const auto original = bytesOf(*layer);

  ColourGradingSession reference(layer);
  reference.preview({0.1f, 1.3f, 0.6f, 1.8f});
  const auto gradedOnce = bytesOf(*layer);
  reference.cancel();
  EXPECT_EQ(bytesOf(*layer), original);

  ColourGradingSession session(layer);
  for (float b = -0.5f; b <= 0.5f; b += 0.25f) {
    session.preview({b, 0.5f, 2.0f, 0.4f});
  }
  session.preview({0.1f, 1.3f, 0.6f, 1.8f});
  EXPECT_EQ(bytesOf(*layer), gradedOnce);
  // Only colours changed: positions and luck are as they were.
  for (std::size_t i = 0; i < original.size(); i += 16) {
    ASSERT_TRUE(
        std::equal(original.begin() + i, original.begin() + i + 12, gradedOnce.begin() + i));
    ASSERT_EQ(original[i + 15], gradedOnce[i + 15]);
  }
  session.cancel();
  EXPECT_EQ(bytesOf(*layer), original);
  EXPECT_FALSE(layer->isModified());
}

TEST(ColourGradingSession, ACommitIsOneUndoStepThatRestoresTheOriginalsExactly) {
  testing::MemoryDefaults defaults;
  MyDocument document;
  auto layer = rainbowLayer(kManyPoints);
  document.addLayer(layer);
  document.undoManager().removeAllActions();
  const auto original = bytesOf(*layer);

  ColourGradingSession session(layer);
  session.preview({-0.2f, 1.5f, 0.0f, 2.2f});
  const auto graded = bytesOf(*layer);
  ASSERT_NE(graded, original);
  EXPECT_TRUE(session.commit(document));
  document.undoManager().closeEventGroup();
  EXPECT_EQ(bytesOf(*layer), graded);
  EXPECT_TRUE(layer->isModified());
  EXPECT_EQ(document.undoManager().undoActionName(), kColourGradingActionName);

  document.undoManager().undo();
  EXPECT_EQ(bytesOf(*layer), original);
  EXPECT_FALSE(document.undoManager().canUndo());
  EXPECT_EQ(document.undoManager().redoActionName(), kColourGradingActionName);
  document.undoManager().redo();
  EXPECT_EQ(bytesOf(*layer), graded);
  document.undoManager().undo();
  EXPECT_EQ(bytesOf(*layer), original);
}

TEST(ColourGradingSession, ALayerWhosePointsWereReplacedIsLeftAlone) {
  testing::MemoryDefaults defaults;
  MyDocument document;
  auto layer = rainbowLayer(100);
  document.addLayer(layer);
  document.undoManager().removeAllActions();

  ColourGradingSession session(layer);
  layer->allocatePointArrayWithSize(100);  // zeroed records
  session.preview({0.5f, 1, 1, 1});
  EXPECT_EQ(layer->colorPoints()[0].r, 0);
  EXPECT_FALSE(session.commit(document));
  EXPECT_FALSE(document.undoManager().canUndo());

  // A committed step whose layer lost its records since undoes nothing.
  auto other = rainbowLayer(10);
  document.addLayer(other);
  document.undoManager().removeAllActions();
  ColourGradingSession second(other);
  second.preview({0.5f, 1, 1, 1});
  ASSERT_TRUE(second.commit(document));
  document.undoManager().closeEventGroup();
  other->allocatePointArrayWithSize(10);
  document.undoManager().undo();
  EXPECT_EQ(other->colorPoints()[3].r, 0);

  // An empty layer grades nothing and does not fail.
  auto empty = std::make_shared<PointLayer>();
  ColourGradingSession none(empty);
  none.preview({0.5f, 1, 1, 1});
  none.cancel();
}

class RecordingView : public ColourGradingView {
 public:
  void reloadGrade() override { ++reloads; }
  int reloads = 0;
};

TEST(ColourGradingController, PreviewsOnTheSelectedLayerAndPutsItBackWhenTheSelectionMoves) {
  testing::MemoryDefaults defaults;
  auto document = std::make_shared<MyDocument>();
  auto first = rainbowLayer(300);
  auto second = rainbowLayer(300);
  document->addLayer(first);
  document->addLayer(second);
  document->undoManager().removeAllActions();
  const auto original = bytesOf(*second);

  ColourGradingController controller;
  RecordingView view;
  controller.setView(&view);
  controller.setGrade({0.3f, 1, 1, 1});  // no document: nothing to grade
  EXPECT_FALSE(controller.isPreviewing());
  controller.setDocument(document);
  EXPECT_EQ(controller.layer(), second);

  controller.setGrade({0.3f, 1, 1, 1});
  EXPECT_TRUE(controller.isPreviewing());
  EXPECT_NE(bytesOf(*second), original);
  document->setSelectedLayer(first);
  EXPECT_FALSE(controller.isPreviewing());
  EXPECT_EQ(bytesOf(*second), original);
  EXPECT_TRUE(controller.grade().isIdentity());

  document->setSelectedLayer(second);
  controller.setGrade({0.3f, 1, 1, 1});
  const auto graded = bytesOf(*second);
  EXPECT_TRUE(controller.apply());
  EXPECT_FALSE(controller.isPreviewing());
  EXPECT_FALSE(controller.apply());  // nothing previewed since
  document->undoManager().closeEventGroup();
  EXPECT_EQ(bytesOf(*second), graded);
  document->undoManager().undo();
  EXPECT_EQ(bytesOf(*second), original);

  controller.setGrade({0, 1, 0.0f, 1});
  controller.cancel();
  EXPECT_EQ(bytesOf(*second), original);

  // Redoing the grading while another preview shows ends the preview
  // first: the history's colours win, and a later cancel keeps them.
  controller.setGrade({0, 1, 0.0f, 1});
  document->undoManager().redo();
  EXPECT_EQ(bytesOf(*second), graded);
  EXPECT_FALSE(controller.isPreviewing());
  EXPECT_TRUE(controller.grade().isIdentity());
  controller.cancel();
  EXPECT_EQ(bytesOf(*second), graded);
  controller.setGrade({0.1f, 1, 1, 1});  // a new preview from the redone colours
  controller.cancel();
  EXPECT_EQ(bytesOf(*second), graded);
  document->undoManager().undo();
  EXPECT_EQ(bytesOf(*second), original);
  EXPECT_GT(view.reloads, 0);
  controller.setView(nullptr);
}

}  // namespace
}  // namespace cloudreel
