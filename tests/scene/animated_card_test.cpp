// The picture card: which picture a time shows, what the card draws in
// real pixels, what it does with missing pictures, the memory a long
// sequence takes, and what it archives.
#include "scene/animated_card.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <string>
#include <vector>

#include "platform/run_loop.h"
#include "render/gl/image_file.h"
#include "render/render_options.h"
#include "scene/archive_helpers.h"
#include "scene/my_document.h"
#include "support/pixel_harness.h"
#include "support/temp_dir.h"
#include "timeline/timeline_track.h"

namespace cloudreel {
namespace {

namespace fs = std::filesystem;
using testing::Box;
using testing::Frame;
using testing::Rgba;
using testing::TempDir;

// A w × h picture of one colour, as a TIFF file.
void writePicture(const fs::path& file, Rgba colour, int w = 8, int h = 4) {
  gl::RgbaImage image{w, h, {}};
  for (int i = 0; i < w * h; ++i) {
    image.pixels.insert(image.pixels.end(), {colour.r, colour.g, colour.b, 255});
  }
  Error error;
  ASSERT_TRUE(gl::writeColorTiff(file, image, &error)) << error.message;
}

// Frame n's colour in the generated sequences: distinct for each n.
Rgba colourOf(int n) {
  return {static_cast<std::uint8_t>(40 + 7 * n % 200), static_cast<std::uint8_t>(255 - 5 * n % 250),
          static_cast<std::uint8_t>(n * 37 % 256), 255};
}

// Writes shot_0001.tif ... for the numbers given; answers the pattern.
std::string writeSequence(const fs::path& folder, const std::vector<int>& numbers, int w = 8,
                          int h = 4) {
  for (int n : numbers) {
    char name[32];
    std::snprintf(name, sizeof name, "shot_%04d.tif", n);
    writePicture(folder / name, colourOf(n), w, h);
  }
  return (folder / "shot_%04d.tif").string();
}

RenderOptions editorOptions() {
  RenderOptions options;
  options.setValueForKey(true, kRenderOptionEditor);
  return options;
}

TEST(AnimatedCard, TheTimelineTimePicksThePictureHeldWithinTheSequence) {
  const TempDir dir;
  AnimatedCard card;
  card.setImagePath(writeSequence(dir.path(), {1, 2, 3, 4}, 16, 9));
  ASSERT_TRUE(card.hasImages()) << card.sourceError();
  EXPECT_EQ(card.nFrames(), 4);
  EXPECT_FLOAT_EQ(card.aspect(), 16.0f / 9.0f);
  card.setFPS(10);
  const struct {
    float seconds;
    int offset;
    int picture;
  } cases[] = {{0.0f, 0, 0}, {0.19f, 0, 1}, {0.2f, 0, 2}, {5.0f, 0, 3},
               {-1.0f, 0, 0}, {0.0f, 2, 2}, {0.1f, -1, 0}, {1e30f, 7, 3}};
  for (const auto& c : cases) {
    card.setFrameOffset(c.offset);
    card.setFrameForTime(c.seconds);
    EXPECT_EQ(card.pictureIndex(), c.picture) << c.seconds << " s, offset " << c.offset;
  }
  // The Time track drives the frame; the opacity has its own track.
  std::vector<std::shared_ptr<TimelineTrack>> tracks;
  const auto shared = std::make_shared<AnimatedCard>();
  shared->getAnimatablePropsInArray(tracks);
  ASSERT_EQ(tracks.size(), 3u);
  EXPECT_EQ(tracks[1]->title(), "Time");
  EXPECT_EQ(tracks[2]->title(), "Opacity");
}

TEST(AnimatedCard, ASourceThatGivesNoPictureLeavesAnEmptyCardThatSaysWhy) {
  const TempDir dir;
  AnimatedCard card;
  card.setImagePath((dir.path() / "nothing_%03d.png").string());
  EXPECT_FALSE(card.hasImages());
  EXPECT_EQ(card.nFrames(), 0);
  EXPECT_NE(card.sourceError().find("nothing_%03d.png"), std::string::npos) << card.sourceError();
  EXPECT_TRUE(card.pictureFile().empty());
}

TEST(AnimatedCard, ArchivesItsSourceAndSettingsAndFindsThePicturesAgain) {
  const TempDir dir;
  auto card = std::make_shared<AnimatedCard>();
  card->setImagePath(writeSequence(dir.path(), {3, 4, 5}));
  card->setCardHeight(2.5f);
  card->setOpacity(0.4f);
  card->setFrameOffset(-2);
  card->setFPS(12);
  card->setFrame(7.5f);
  const auto back = testing::roundTrip(card);
  ASSERT_TRUE(back);
  EXPECT_EQ(back->imagePath(), card->imagePath());
  EXPECT_EQ(back->nFrames(), 3);
  EXPECT_FLOAT_EQ(back->cardHeight(), 2.5f);
  EXPECT_FLOAT_EQ(back->opacity(), 0.4f);
  EXPECT_EQ(back->frameOffset(), -2);
  EXPECT_EQ(back->FPS(), 12);
  EXPECT_EQ(back->pictureFile(), card->pictureFile());

  // Pictures gone since the save: the document still opens, the card is
  // empty and says so.
  fs::remove_all(dir.path() / "shot_0003.tif");
  fs::remove_all(dir.path() / "shot_0004.tif");
  fs::remove_all(dir.path() / "shot_0005.tif");
  const auto orphan = testing::roundTrip(card);
  ASSERT_TRUE(orphan);
  EXPECT_FALSE(orphan->hasImages());
  EXPECT_FALSE(orphan->sourceError().empty());

  const auto copy = std::static_pointer_cast<AnimatedCard>(back->copy());
  EXPECT_EQ(copy->name(), "Card copy");
  EXPECT_EQ(copy->imagePath(), back->imagePath());
  EXPECT_FLOAT_EQ(copy->opacity(), 0.4f);
}

TEST(AnimatedCard, EditsThroughTheDocumentAreUndoable) {
  const TempDir dir;
  MyDocument document;
  const auto card = std::make_shared<AnimatedCard>();
  document.addLayer(card);
  document.undoManager().closeEventGroup();
  const std::string pattern = writeSequence(dir.path(), {1, 2});
  card->setValueForKey(pattern, "imagePath");
  document.undoManager().closeEventGroup();
  EXPECT_EQ(document.undoManager().undoActionName(), "Change Picture");
  EXPECT_EQ(card->nFrames(), 2);
  document.undoManager().undo();
  EXPECT_EQ(card->imagePath(), "");
  EXPECT_EQ(card->nFrames(), 0);
}

class AnimatedCardDrawingTest : public testing::PixelTest {
 protected:
  // The card seen face on, 100 units high: one unit a pixel.
  Frame draw(AnimatedCard& card, const RenderOptions& options = RenderOptions()) {
    card.setCardHeight(100.0f);
    return render(240, 120, [&] { card.drawGLWithOptions(options); });
  }
};

TEST_F(AnimatedCardDrawingTest, ShowsThePictureOfItsFrameAtTheImagesAspectAndOpacity) {
  const TempDir dir;
  AnimatedCard card;
  card.setImagePath(writeSequence(dir.path(), {1, 2, 3}, 16, 8));
  Frame frame = draw(card);
  // 200 × 100 pixels centred in the frame, all of the first picture.
  EXPECT_EQ(frame.boundsOf(colourOf(1)), (Box{20, 10, 220, 110}));
  EXPECT_EQ(frame.countDrawn(), 200 * 100);

  card.setFrame(2.0f);
  frame = draw(card);
  EXPECT_EQ(frame.count(colourOf(3)), 200 * 100);

  card.setOpacity(0.5f);
  frame = draw(card);
  const Rgba half{static_cast<std::uint8_t>(colourOf(3).r / 2),
                  static_cast<std::uint8_t>(colourOf(3).g / 2),
                  static_cast<std::uint8_t>(colourOf(3).b / 2),
                  // Alpha blends too: 0.5 × 0.5 + 1 × (1 − 0.5).
                  191};
  EXPECT_TRUE(testing::pixelIs(frame, 120, 60, half, 2));
}

TEST_F(AnimatedCardDrawingTest, AMissingPictureShowsTheLastGoodOneAndIsNamedOnce) {
  const TempDir dir;
  AnimatedCard card;
  // Number 2 is not there: frame 1 of the sequence has no file.
  card.setImagePath(writeSequence(dir.path(), {1, 3}));
  ASSERT_EQ(card.nFrames(), 3);
  EXPECT_EQ(draw(card).count(colourOf(1)), 200 * 100);
  card.setFrame(1.0f);
  EXPECT_EQ(draw(card).count(colourOf(1)), 200 * 100);
  EXPECT_EQ(draw(card).count(colourOf(1)), 200 * 100);
  EXPECT_EQ(card.missingFiles(), (std::set<fs::path>{dir.path() / "shot_0002.tif"}));
  card.setFrame(2.0f);
  EXPECT_EQ(draw(card).count(colourOf(3)), 200 * 100);
}

TEST_F(AnimatedCardDrawingTest, TheEditorNeverWaitsAndShowsThePictureOnceDecoded) {
  const TempDir dir;
  auto card = std::make_shared<AnimatedCard>();
  card->setImagePath(writeSequence(dir.path(), {1, 2}));
  // Without pictures yet the editor shows where the card is; rendered
  // frames show nothing of the editor's.
  AnimatedCard empty;
  EXPECT_GT(draw(empty, editorOptions()).countDrawn(), 0);
  EXPECT_EQ(draw(empty).countDrawn(), 0);

  int picture = 0;
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(20);
  while (picture == 0 && std::chrono::steady_clock::now() < deadline) {
    picture = draw(*card, editorOptions()).count(colourOf(1));
    RunLoop::main().runUntil(std::chrono::steady_clock::now() + std::chrono::milliseconds(5));
  }
  EXPECT_EQ(picture, 200 * 100);
}

TEST_F(AnimatedCardDrawingTest, ASequenceLongerThanTheBudgetsPlaysInBoundedMemory) {
  const TempDir dir;
  std::vector<int> numbers;
  for (int n = 1; n <= 40; ++n) {
    numbers.push_back(n);
  }
  AnimatedCard card;
  card.setImagePath(writeSequence(dir.path(), numbers, 64, 32));
  ASSERT_EQ(card.nFrames(), 40);
  for (int frame = 0; frame < 40; ++frame) {
    card.setFrame(static_cast<float>(frame));
    const Frame drawn = draw(card);
    ASSERT_EQ(drawn.count(colourOf(frame + 1)), 200 * 100) << "frame " << frame;
    ASSERT_LE(card.texturesHeld(), AnimatedCard::kTextureBudget);
    ASSERT_LE(card.picturesDecoded(), AnimatedCard::kDecodeBudget);
  }
}

}  // namespace
}  // namespace cloudreel
