// The Layer menu's picture card and ocean as a user adds them: the card's
// picture shows in the view once it has been decoded in the background,
// and the ocean comes with the track that moves its waves, both gone again
// with one undo from the Edit menu.

#include <QColor>
#include <QImage>

#include "app/app_fixture.h"
#include "app/gl_view_widget.h"
#include "scene/animated_card.h"
#include "scene/my_document.h"
#include "scene/ocean_fft.h"
#include "timeline/timeline.h"
#include "timeline/timeline_track.h"

namespace cloudreel::app::test {
namespace {

int magentaPixels(const QImage& image) {
  int count = 0;
  for (int y = 0; y < image.height(); ++y) {
    for (int x = 0; x < image.width(); ++x) {
      const QColor c = image.pixelColor(x, y);
      count += c.red() > 200 && c.green() < 60 && c.blue() > 200 ? 1 : 0;
    }
  }
  return count;
}

TEST_F(AppTest, APictureCardAndAnOceanAreAddedFromTheLayerMenu) {
  DocumentWindow& window = start();
  const std::shared_ptr<MyDocument> document = window.document();
  QImage picture(64, 32, QImage::Format_RGB32);
  picture.fill(QColor(255, 0, 255));
  const std::filesystem::path file = dir / "poster.png";
  ASSERT_TRUE(picture.save(QString::fromStdString(file.string())));

  user->answerOpenPanelWith(file.string());
  menuItem(window, QStringLiteral("Layer"), QStringLiteral("Add Picture Card…"))->trigger();
  ASSERT_EQ(document->layers().size(), 1u);
  const auto card = std::dynamic_pointer_cast<AnimatedCard>(document->layers()[0]);
  ASSERT_TRUE(card);
  EXPECT_EQ(card->name(), "poster");
  EXPECT_FLOAT_EQ(card->aspect(), 2.0f);
  // The view never waits for the picture: it shows once decoded.
  GLViewWidget& view = window.glView();
  EXPECT_TRUE(QTest::qWaitFor([&] { return magentaPixels(view.grabFramebuffer()) > 20; }, 10000));

  menuItem(window, QStringLiteral("Layer"), QStringLiteral("Add Ocean"))->trigger();
  ASSERT_EQ(document->layers().size(), 2u);
  const auto ocean = std::dynamic_pointer_cast<OceanFFT>(document->layers()[1]);
  ASSERT_TRUE(ocean);
  const auto& tracks = document->timeline()->tracks();
  ASSERT_FALSE(tracks.empty());
  EXPECT_EQ(tracks.back()->theObject(), ocean);
  EXPECT_EQ(tracks.back()->managedKey(), "frame");
  // Moving the timeline moves the waves.
  document->timeline()->applyForTime(1.5f);
  EXPECT_FLOAT_EQ(ocean->time(), 1.5f);

  document->undoManager().closeEventGroup();
  QMenu* editMenu = nullptr;
  QAction* undo = menuItem(window, QStringLiteral("Edit"), QStringLiteral("Undo"), &editMenu);
  ASSERT_NE(undo, nullptr);
  openMenu(editMenu);
  EXPECT_EQ(undo->text(), QStringLiteral("Undo Add Ocean"));
  undo->trigger();
  EXPECT_EQ(document->layers().size(), 1u);
  EXPECT_EQ(document->timeline()->tracks().back()->theObject(), nullptr);
}

}  // namespace
}  // namespace cloudreel::app::test
