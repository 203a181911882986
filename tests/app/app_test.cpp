// The desktop application driven as a person drives it: real windows on an
// X server (xvfb-run in CI), real OpenGL, key presses and mouse drags sent
// to the view, menus opened, documents saved and opened again.

#include <gtest/gtest.h>

#include <QApplication>
#include <QCheckBox>
#include <QDialogButtonBox>
#include <QFileDialog>
#include <QListView>
#include <QMenu>
#include <QMenuBar>
#include <QProgressDialog>
#include <QPushButton>
#include <QSpinBox>
#include <QTest>
#include <QTimer>
#include <QTreeView>

#include "app/app_fixture.h"
#include "app/application.h"
#include "app/document_window.h"
#include "app/gl_view_widget.h"
#include "app/import_options_panel.h"
#include "camera/scene_camera.h"
#include "geometry/affine_transform.h"
#include "platform/user_defaults.h"
#include "scene/layer.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"
#include "support/cli_runner.h"
#include "support/memory_defaults.h"
#include "support/ply_text.h"
#include "support/scripted_user_interaction.h"
#include "support/temp_dir.h"

namespace cloudreel::app {
namespace {

using namespace test;

TEST(AppScreenshot, ThePictureOfAnImportedCloudShowsItsPointsWhereTheyBelong) {
  TempDir dir;
  writeRedSquare(dir / "square.ply");
  const auto run = testing::runProgram(
      dir.path(),
      {CLOUDREEL_APP_BINARY, "--screenshot", "shot.png", "--window-size", "640x480", "square.ply"});
  ASSERT_EQ(run.status, 0) << run.err;
  QImage image;
  ASSERT_TRUE(image.load(QString::fromStdString((dir / "shot.png").string())));
  const auto [left, right] = redPixelsLeftAndRight(image);
  EXPECT_EQ(left, 0);
  EXPECT_GT(right, 20);

  const auto bad = testing::runProgram(
      dir.path(), {CLOUDREEL_APP_BINARY, "--screenshot", "none.png", "missing.reel"});
  EXPECT_NE(bad.status, 0);
  EXPECT_FALSE(std::filesystem::exists(dir / "none.png"));
}

TEST_F(AppTest, KeysAndDragsMoveTheCamerasAndThePixels) {
  writeRedSquare(dir / "square.ply");
  DocumentWindow& window = start({dir / "square.ply"});
  waitForImports();
  GLViewWidget& view = window.glView();
  PointsDocumentGLView& pointView = view.pointView();
  window.document()->setOverrideBuckets(false);
  view.setFocus();
  const QImage first = view.grabFramebuffer();
  const int redAtFirst = redPixelsLeftAndRight(first).second;
  EXPECT_GT(redAtFirst, 100);

  // A right drag moves the scene camera along its view: the square's size
  // changes.
  const auto sceneBefore = pose(*window.document()->sceneCamera());
  drag(view, Qt::RightButton, {320, 200}, {320, 300});
  EXPECT_NE(pose(*window.document()->sceneCamera()), sceneBefore);
  EXPECT_NE(redPixelsLeftAndRight(view.grabFramebuffer()).second, redAtFirst);

  // Through the free trackball camera (chosen in the View menu), a left
  // drag turns the view.
  QMenu* cameraMenu = nullptr;
  for (QMenu* menu : window.menuBar()->findChildren<QMenu*>()) {
    cameraMenu = menu->title() == "Camera" ? menu : cameraMenu;
  }
  ASSERT_NE(cameraMenu, nullptr);
  cameraMenu->actions().at(PointsDocumentGLView::kTrackballCamera)->trigger();
  EXPECT_EQ(pointView.cameraMode(), PointsDocumentGLView::kTrackballCamera);
  const QImage throughTrackball = view.grabFramebuffer();
  drag(view, Qt::LeftButton, {320, 240}, {500, 240});
  EXPECT_NE(view.grabFramebuffer(), throughTrackball);

  // '2' looks down an axis orthographically, where 'a' and 'd' slide the
  // view and 'z' puts it back; '~' returns to the perspective view.
  QTest::keyClick(&view, '2');
  EXPECT_EQ(pointView.viewMode(), PointsDocumentGLView::kOrthographic);
  const QImage orthographic = view.grabFramebuffer();
  QTest::keyClick(&view, Qt::Key_A);
  QTest::keyClick(&view, Qt::Key_A);
  EXPECT_EQ(pointView.keyboardTranslation()[0], 1.0);
  EXPECT_NE(view.grabFramebuffer(), orthographic);
  QTest::keyClick(&view, Qt::Key_Z);
  EXPECT_EQ(pointView.keyboardTranslation()[0], 0.0);
  EXPECT_EQ(view.grabFramebuffer(), orthographic);
  QTest::keyClick(&view, '~');
  EXPECT_EQ(pointView.viewMode(), PointsDocumentGLView::kNormal);
}

TEST_F(AppTest, TheImportPanelOffersTheSelectedFilesOptionsAndReadingShowsProgress) {
  writeRedSquare(dir / "square.ply");
  testing::writeFile(dir / "notes.txt", "not points");
  start();
  // Real dialogs for this one: the panel is Qt's own file dialog.
  auto dialogs = std::make_shared<QtUserInteraction>();
  dialogs->setOpenPanelHook([&](QFileDialog& dialog) { application->customizeOpenPanel(dialog); });
  UserInteraction::setShared(dialogs);

  std::vector<ImportOptionsView> shown;
  QTimer::singleShot(0, [&] {
    auto* dialog = qobject_cast<QFileDialog*>(QApplication::activeModalWidget());
    ASSERT_NE(dialog, nullptr);
    auto cancel = qScopeGuard([&] { dialog->reject(); });
    auto* options = dialog->findChild<ImportOptionsPanel*>();
    ASSERT_NE(options, nullptr);
    dialog->setDirectory(QString::fromStdString(dir.path().string()));
    shown.push_back(options->shownView());
    ASSERT_TRUE(clickFile(*dialog, QStringLiteral("notes.txt")));
    shown.push_back(options->shownView());
    ASSERT_TRUE(clickFile(*dialog, QStringLiteral("square.ply")));
    shown.push_back(options->shownView());
    // Keep one vertex in four: the choice goes to the defaults the import
    // reads once the panel closes.
    QCheckBox* downsample = nullptr;
    for (QCheckBox* box : options->findChildren<QCheckBox*>()) {
      downsample = box->text().startsWith(QStringLiteral("Keep one")) ? box : downsample;
    }
    ASSERT_TRUE(downsample != nullptr && downsample->isVisible());
    QTest::mouseClick(downsample, Qt::LeftButton);
    options->findChild<QSpinBox*>()->setValue(4);
    auto* buttons = dialog->findChild<QDialogButtonBox*>();
    ASSERT_TRUE(buttons != nullptr && buttons->button(QDialogButtonBox::Open) != nullptr);
    cancel.dismiss();
    buttons->button(QDialogButtonBox::Open)->click();
  });
  application->commands().importPointFile();
  using V = ImportOptionsView;
  EXPECT_EQ(shown, (std::vector<V>{V::None, V::None, V::Ply}));

  // The file is read in the background; the progress dialog names it until
  // the layer is in.
  QProgressDialog* progress = application->importProgress();
  ASSERT_NE(progress, nullptr);
  EXPECT_TRUE(progress->labelText().contains(QStringLiteral("square.ply")));
  waitForImports();
  EXPECT_EQ(application->importProgress(), nullptr);
  const auto& layers = application->mainWindow()->document()->layers();
  ASSERT_EQ(layers.size(), 1u);
  EXPECT_EQ(std::static_pointer_cast<PointLayer>(layers[0])->nPoints(), 40 * 40 / 4);
}

TEST_F(AppTest, MenusEnableTheirItemsAsTheDocumentStands) {
  DocumentWindow& window = start();
  QMenu* layerMenu = nullptr;
  QAction* next = menuItem(window, "Layer", "Next Layer", &layerMenu);
  QAction* previous = menuItem(window, "Layer", "Previous Layer");
  QAction* reRandomize = menuItem(window, "Layer", "Re-randomize Buckets…");
  ASSERT_TRUE(next && previous && reRandomize);

  openMenu(layerMenu);  // nothing selected
  EXPECT_FALSE(next->isEnabled());
  EXPECT_FALSE(reRandomize->isEnabled());

  application->commands().addPoint();
  application->commands().addPoint();
  openMenu(layerMenu);  // the second, last layer selected
  EXPECT_FALSE(next->isEnabled());
  EXPECT_TRUE(previous->isEnabled());
  previous->trigger();
  EXPECT_EQ(window.document()->selectedLayer(), window.document()->layers()[0]);
  openMenu(layerMenu);
  EXPECT_TRUE(next->isEnabled());
  EXPECT_FALSE(previous->isEnabled());
  // The layers panel follows the document's selection.
  EXPECT_EQ(window.layersView().currentIndex().row(), 0);

  QMenu* editMenu = nullptr;
  QAction* undo = menuItem(window, "Edit", "Undo", &editMenu);
  ASSERT_NE(undo, nullptr);
  window.document()->undoManager().closeEventGroup();
  openMenu(editMenu);
  EXPECT_EQ(undo->text(), "Undo New Layer");
  EXPECT_TRUE(window.isWindowModified());
  undo->trigger();
  undo->trigger();
  EXPECT_TRUE(window.document()->layers().empty());
  EXPECT_FALSE(window.isWindowModified());
}

TEST_F(AppTest, ADocumentEditedSavedAndOpenedAgainKeepsItsLayersAndName) {
  DocumentWindow& window = start();
  EXPECT_EQ(window.windowTitle(), "Untitled[*]");
  application->commands().addPrimitive();
  const auto layer = window.document()->layers().at(0);
  QTreeView& outline = window.layersView();
  ASSERT_EQ(outline.model()->rowCount(), 1);
  outline.model()->setData(outline.model()->index(0, 0), QStringLiteral("Ball"));
  EXPECT_EQ(layer->name(), "Ball");
  EXPECT_TRUE(window.isWindowModified());

  user->answerSavePanelWith((dir / "ball.reel").string());
  window.save();
  EXPECT_FALSE(window.isWindowModified());
  EXPECT_EQ(window.windowTitle(), "ball.reel[*]");
  window.close();
  EXPECT_TRUE(application->windows().empty());

  DocumentWindow* reopened = application->openFile(dir / "ball.reel");
  ASSERT_NE(reopened, nullptr);
  ASSERT_EQ(reopened->document()->layers().size(), 1u);
  EXPECT_EQ(reopened->document()->layers()[0]->name(), "Ball");
  EXPECT_EQ(application->recentDocuments().front(), dir / "ball.reel");

  // A second view of the same document; closing one leaves the other and
  // asks nothing, closing the last of an edited document asks.
  application->openNewView(*reopened);
  ASSERT_EQ(application->windows().size(), 2u);
  reopened->document()->addLayer(std::make_shared<Layer>());
  application->windows()[1]->close();
  EXPECT_TRUE(user->alerts.empty());
  user->answerAlertsWith({1});  // Cancel
  EXPECT_FALSE(application->windows()[0]->close());
  ASSERT_EQ(user->alerts.size(), 1u);
  user->answerAlertsWith({2});  // Don't Save
  EXPECT_TRUE(application->windows()[0]->close());
  EXPECT_TRUE(application->windows().empty());
}

}  // namespace
}  // namespace cloudreel::app
