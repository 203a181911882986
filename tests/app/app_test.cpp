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

#include "app/application.h"
#include "app/document_window.h"
#include "app/gl_view_widget.h"
#include "app/import_options_panel.h"
#include "app/qt_gl_context.h"
#include "camera/scene_camera.h"
#include "geometry/affine_transform.h"
#include "platform/class_registry.h"
#include "platform/user_defaults.h"
#include "scene/core_classes.h"
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

using testing::TempDir;

// A square of bright red points at x 2..3, right of where the default scene
// camera (15 units along +z, looking at the origin) looks.
void writeRedSquare(const std::filesystem::path& path) {
  testing::PlyElement vertex{"vertex", testing::kPlyXyzRgb, {}};
  for (int i = 0; i < 40; ++i) {
    for (int j = 0; j < 40; ++j) {
      vertex.instances.push_back({2.0 + i / 40.0, -0.5 + j / 40.0, 0.0, 255.0, 0.0, 0.0});
    }
  }
  testing::writeFile(path, testing::plyText({vertex}, "binary_little_endian"));
}

bool isRed(QRgb pixel) { return qRed(pixel) > 150 && qGreen(pixel) < 80 && qBlue(pixel) < 80; }

// Red pixels in the left 45% of the picture and in its right 30% (the red
// x axis drawn from the middle ends between the two).
std::pair<int, int> redPixelsLeftAndRight(const QImage& image) {
  int left = 0, right = 0;
  for (int y = 0; y < image.height(); ++y) {
    for (int x = 0; x < image.width(); ++x) {
      if (isRed(image.pixel(x, y))) {
        left += x < image.width() * 45 / 100 ? 1 : 0;
        right += x > image.width() * 70 / 100 ? 1 : 0;
      }
    }
  }
  return {left, right};
}

QAction* menuItem(QMainWindow& window, const QString& menuTitle, const QString& itemTitle,
                  QMenu** menuOut = nullptr) {
  for (QAction* top : window.menuBar()->actions()) {
    if (top->menu() != nullptr && top->text().remove('&') == menuTitle) {
      if (menuOut != nullptr) {
        *menuOut = top->menu();
      }
      for (QAction* action : top->menu()->actions()) {
        if (action->text() == itemTitle) {
          return action;
        }
      }
    }
  }
  return nullptr;
}

// Where a camera stands and which way it looks.
std::array<double, 6> pose(const Camera& camera) {
  const AffineTransform& m = *camera.objectToWorld();
  const auto z = m.basisVectorZ();
  return {m.translationX(), m.translationY(), m.translationZ(), z->x(), z->y(), z->z()};
}

// A menu as it is when the user opens it.
void openMenu(QMenu* menu) { emit menu->aboutToShow(); }

class AppTest : public ::testing::Test {
 protected:
  void SetUp() override {
    previousUser_ = UserInteraction::setShared(user);
    UserDefaults::standardUserDefaults().setObjectForKey(false, "KTEmptyDoc");
  }
  void TearDown() override {
    application.reset();
    UserInteraction::setShared(previousUser_);
  }

  DocumentWindow& start(std::vector<std::filesystem::path> files = {}) {
    application = std::make_unique<Application>(Application::Options{files, {}, 640, 480});
    EXPECT_TRUE(application->launch());
    DocumentWindow* window = files.empty() ? application->newDocument() : application->mainWindow();
    EXPECT_NE(window, nullptr);
    EXPECT_TRUE(QTest::qWaitForWindowExposed(window));
    return *window;
  }

  // Waits until the background imports have been added.
  void waitForImports() {
    EXPECT_TRUE(
        QTest::qWaitFor([&] { return application->commands().importsInProgress() == 0; }, 10000));
  }

  testing::MemoryDefaults defaults;
  TempDir dir;
  std::shared_ptr<testing::ScriptedUserInteraction> user =
      std::make_shared<testing::ScriptedUserInteraction>();
  std::unique_ptr<Application> application;

 private:
  std::shared_ptr<UserInteraction> previousUser_;
};

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

// A drag from one point to another with the given button held.
void drag(QWidget& widget, Qt::MouseButton button, QPoint from, QPoint to) {
  QTest::mousePress(&widget, button, {}, from);
  for (int step = 1; step <= 10; ++step) {
    const QPointF at = from + (to - from) * step / 10.0;
    QMouseEvent move(QEvent::MouseMove, at, widget.mapToGlobal(at), Qt::NoButton, button,
                     Qt::NoModifier);
    QApplication::sendEvent(&widget, &move);
  }
  QTest::mouseRelease(&widget, button, {}, to);
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

// Clicks the file of that name in an open panel's list, once the panel has
// read its folder.
bool clickFile(QFileDialog& dialog, const QString& name) {
  auto* list = dialog.findChild<QListView*>(QStringLiteral("listView"));
  if (list == nullptr) {
    return false;
  }
  QModelIndex found;
  const bool listed = QTest::qWaitFor([&] {
    const QAbstractItemModel* model = list->model();
    for (int row = 0; row < model->rowCount(list->rootIndex()); ++row) {
      const QModelIndex index = model->index(row, 0, list->rootIndex());
      if (index.data().toString() == name) {
        found = index;
        return true;
      }
    }
    return false;
  });
  if (!listed) {
    return false;
  }
  QTest::mouseClick(list->viewport(), Qt::LeftButton, {}, list->visualRect(found).center());
  return true;
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

int main(int argc, char** argv) {
  QCoreApplication::setAttribute(Qt::AA_ShareOpenGLContexts);
  cloudreel::app::setDefaultSurfaceFormat();
  QApplication application(argc, argv);
  cloudreel::registerCoreClasses(cloudreel::ClassRegistry::shared());
  ::testing::InitGoogleTest(&argc, argv);
  return RUN_ALL_TESTS();
}
