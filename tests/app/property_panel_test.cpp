// The properties and colour grading panels, driven as a person would: open
// them from the Window menu, type and click in them, and see the picture
// and the Edit menu follow.
#include "app/property_panel.h"

#include <QCheckBox>
#include <QDoubleSpinBox>
#include <QPushButton>
#include <QSlider>

#include "app/app_fixture.h"
#include "app/colour_grading_panel.h"
#include "app/gl_view_widget.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"

namespace cloudreel::app::test {
namespace {

// Red pixels of the square (the right of the picture: the red x axis ends
// before it).
int redPixels(const QImage& image) { return redPixelsLeftAndRight(image).second; }

class PanelTest : public AppTest {
 protected:
  DocumentWindow& openSquare() {
    writeRedSquare(dir / "square.ply");
    DocumentWindow& window = start({dir / "square.ply"});
    waitForImports();
    window.document()->setOverrideBuckets(false);
    layer = std::dynamic_pointer_cast<PointLayer>(window.document()->selectedLayer());
    EXPECT_NE(layer, nullptr);
    return window;
  }

  // Undoes the latest step through the Edit menu, after checking its title.
  void undoThroughTheMenu(DocumentWindow& window, const QString& expectedTitle) {
    QMenu* editMenu = nullptr;
    (void)menuItem(window, "Edit", "", &editMenu);
    ASSERT_NE(editMenu, nullptr);
    // The item is titled after the step it undoes.
    QAction* undo = nullptr;
    for (QAction* action : editMenu->actions()) {
      undo = undo == nullptr && action->text().startsWith("Undo") ? action : undo;
    }
    ASSERT_NE(undo, nullptr);
    window.document()->undoManager().closeEventGroup();
    openMenu(editMenu);
    EXPECT_EQ(undo->text(), expectedTitle);
    undo->trigger();
  }

  std::shared_ptr<PointLayer> layer;
};

TEST_F(PanelTest, ThePropertiesPanelEditsTheSelectedLayerUndoably) {
  DocumentWindow& window = openSquare();
  ASSERT_NE(layer, nullptr);
  GLViewWidget& view = window.glView();
  const int redAtFirst = redPixels(view.grabFramebuffer());
  EXPECT_GT(redAtFirst, 100);

  QAction* show = menuItem(window, "Window", "Properties");
  ASSERT_NE(show, nullptr);
  show->trigger();
  PropertyPanel* panel = application->propertyPanel();
  ASSERT_NE(panel, nullptr);
  EXPECT_TRUE(QTest::qWaitForWindowExposed(panel));
  EXPECT_EQ(panel->windowTitle(), "Properties: square.ply");

  // Typing a point size and pressing Return: bigger points, more red.
  auto* size = panel->findChild<QDoubleSpinBox*>(QStringLiteral("pointSize"));
  ASSERT_NE(size, nullptr);
  EXPECT_EQ(size->value(), static_cast<double>(layer->pointSize()));
  size->setFocus();
  size->selectAll();
  QTest::keyClicks(size, QStringLiteral("6"));
  QTest::keyClick(size, Qt::Key_Return);
  EXPECT_EQ(layer->pointSize(), 6.0f);
  // The end of the user's event closes the undo step.
  window.document()->undoManager().closeEventGroup();
  const int redWhenBig = redPixels(view.grabFramebuffer());
  EXPECT_GT(redWhenBig, redAtFirst + 100);

  // Clicking the visibility box hides the layer.
  auto* visible = panel->findChild<QCheckBox*>(QStringLiteral("isVisible"));
  ASSERT_NE(visible, nullptr);
  EXPECT_TRUE(visible->isChecked());
  QTest::mouseClick(visible, Qt::LeftButton, {},
                    QPoint(visible->height() / 2, visible->height() / 2));
  EXPECT_FALSE(layer->isVisible());
  EXPECT_EQ(redPixels(view.grabFramebuffer()), 0);

  undoThroughTheMenu(window, "Undo Layer Visibility");
  EXPECT_TRUE(layer->isVisible());
  EXPECT_TRUE(visible->isChecked());
  EXPECT_EQ(redPixels(view.grabFramebuffer()), redWhenBig);
  undoThroughTheMenu(window, "Undo Change Point Size");
  EXPECT_EQ(layer->pointSize(), 1.0f);
  EXPECT_EQ(size->value(), 1.0);
  EXPECT_EQ(redPixels(view.grabFramebuffer()), redAtFirst);
}

TEST_F(PanelTest, ColourGradingPreviewsCancelsAndAppliesAsOneUndoStep) {
  DocumentWindow& window = openSquare();
  ASSERT_NE(layer, nullptr);
  GLViewWidget& view = window.glView();
  const int redAtFirst = redPixels(view.grabFramebuffer());

  QAction* show = menuItem(window, "Window", "Colour Grading");
  ASSERT_NE(show, nullptr);
  show->trigger();
  ColourGradingPanel* panel = application->colourGradingPanel();
  ASSERT_NE(panel, nullptr);
  EXPECT_TRUE(QTest::qWaitForWindowExposed(panel));
  auto* brightness = panel->findChild<QSlider*>(QStringLiteral("brightness"));
  ASSERT_NE(brightness, nullptr);
  auto buttons = panel->findChildren<QPushButton*>();
  QPushButton* cancel = nullptr;
  QPushButton* apply = nullptr;
  for (QPushButton* button : buttons) {
    (button->text() == "Cancel" ? cancel : apply) = button;
  }
  ASSERT_TRUE(cancel != nullptr && apply != nullptr);
  EXPECT_FALSE(apply->isEnabled());

  // Page Down five times: brightness -0.5 turns the red dark.
  brightness->setFocus();
  for (int i = 0; i < 5; ++i) {
    QTest::keyClick(brightness, Qt::Key_PageDown);
  }
  EXPECT_EQ(layer->colorPoints()[0].r, 128);
  EXPECT_EQ(redPixels(view.grabFramebuffer()), 0);
  EXPECT_TRUE(apply->isEnabled());

  QTest::mouseClick(cancel, Qt::LeftButton);
  EXPECT_EQ(layer->colorPoints()[0].r, 255);
  EXPECT_EQ(brightness->value(), 0);
  EXPECT_EQ(redPixels(view.grabFramebuffer()), redAtFirst);
  EXPECT_FALSE(window.document()->undoManager().canUndo() &&
               window.document()->undoManager().undoActionName() == "Colour Grading");

  for (int i = 0; i < 5; ++i) {
    QTest::keyClick(brightness, Qt::Key_PageDown);
  }
  QTest::mouseClick(apply, Qt::LeftButton);
  EXPECT_EQ(layer->colorPoints()[0].r, 128);
  EXPECT_EQ(redPixels(view.grabFramebuffer()), 0);
  undoThroughTheMenu(window, "Undo Colour Grading");
  EXPECT_EQ(layer->colorPoints()[0].r, 255);
  EXPECT_EQ(redPixels(view.grabFramebuffer()), redAtFirst);
}

}  // namespace
}  // namespace cloudreel::app::test
