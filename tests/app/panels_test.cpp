// The floating panels as a user drives them: choosing a camera of an
// imported reconstruction in the cameras panel shows its photograph and
// lets the view look through it; the view controls switch the view's mode.

#include <QComboBox>
#include <QLabel>
#include <QTreeWidget>

#include "app/app_fixture.h"
#include "app/cameras_panel.h"
#include "app/gl_view_widget.h"
#include "app/photograph_window.h"
#include "app/view_controls_panel.h"
#include "camera/camera_field.h"
#include "render/points_document_gl_view.h"
#include "scene/my_document.h"

namespace cloudreel::app::test {
namespace {

// A reconstruction under the test folder: root/list.txt, the photograph
// root/images/photo.png (64 × 48) and root/bundle/bundle.out with one
// camera standing at (2.5, 0, 5) looking down -z at a square of red points
// right of the origin, which the scene camera sees from afar.
std::filesystem::path writeReconstruction(const TempDir& dir) {
  std::filesystem::create_directories(dir / "images");
  std::filesystem::create_directories(dir / "bundle");
  QImage photo(64, 48, QImage::Format_RGB32);
  photo.fill(Qt::darkCyan);
  EXPECT_TRUE(photo.save(QString::fromStdString((dir / "images/photo.png").string())));
  cloudreel::testing::writeFile(dir / "list.txt", "images/photo.png 0 500\n");
  std::string bundle = "# Bundle file v0.3\n1 1600\n500 0 0\n1 0 0\n0 1 0\n0 0 1\n-2.5 0 -5\n";
  for (int i = 0; i < 40; ++i) {
    for (int j = 0; j < 40; ++j) {
      bundle += std::to_string(2.0 + i / 40.0) + " " + std::to_string(-0.5 + j / 40.0) +
                " 0\n255 0 0\n0\n";
    }
  }
  return cloudreel::testing::writeFile(dir / "bundle/bundle.out", bundle);
}

QImage frameAfterRedraw(GLViewWidget& view) {
  view.update();
  const int painted = view.framesPainted();
  EXPECT_TRUE(QTest::qWaitFor([&] { return view.framesPainted() > painted; }, 5000));
  return view.grabFramebuffer();
}

TEST_F(AppTest, ChoosingACameraShowsItsPhotographAndTheViewLooksThroughIt) {
  DocumentWindow& window = start({writeReconstruction(dir)});
  waitForImports();
  GLViewWidget& view = window.glView();
  const QImage throughSceneCamera = frameAfterRedraw(view);

  menuItem(window, QStringLiteral("Window"), QStringLiteral("Cameras"))->trigger();
  menuItem(window, QStringLiteral("Window"), QStringLiteral("Photograph"))->trigger();
  CamerasPanel* cameras = application->camerasPanel();
  PhotographWindow* photograph = application->photographWindow();
  ASSERT_NE(cameras, nullptr);
  ASSERT_NE(photograph, nullptr);
  ASSERT_TRUE(QTest::qWaitForWindowExposed(cameras));
  EXPECT_EQ(photograph->message(), QStringLiteral("No camera is selected."));

  // The reconstruction's field lists its camera under it.
  QTreeWidget& tree = cameras->tree();
  ASSERT_EQ(tree.topLevelItemCount(), 2);
  QTreeWidgetItem* row = cameras->itemFor({1, 0});
  ASSERT_NE(row, nullptr);
  EXPECT_EQ(row->text(1), QStringLiteral("photo.png"));
  QTest::mouseClick(tree.viewport(), Qt::LeftButton, {}, tree.visualItemRect(row).center());

  const auto field =
      std::dynamic_pointer_cast<CameraField>(cameras->controller().groups()[1].field);
  ASSERT_TRUE(field);
  const auto camera = field->cameras().at(0);
  EXPECT_EQ(window.document()->selectedCamera(), camera);
  EXPECT_EQ(photograph->image().size(), QSize(64, 48));
  EXPECT_FALSE(photograph->label().pixmap().isNull());

  // Looking through the selected camera, chosen in the view controls.
  menuItem(window, QStringLiteral("Window"), QStringLiteral("View Controls"))->trigger();
  ViewControlsPanel* controls = application->viewControls();
  ASSERT_NE(controls, nullptr);
  QComboBox& cameraMode = controls->cameraMode();
  cameraMode.setCurrentIndex(PointsDocumentGLView::kSelectedCamera);
  emit cameraMode.activated(PointsDocumentGLView::kSelectedCamera);
  PointsDocumentGLView& pointView = view.pointView();
  EXPECT_EQ(pointView.cameraMode(), PointsDocumentGLView::kSelectedCamera);
  EXPECT_EQ(pointView.currentCamera(), camera);
  const QImage throughSelected = frameAfterRedraw(view);
  EXPECT_NE(throughSelected, throughSceneCamera);
  // The camera stands right in front of the red square, which fills its
  // picture to the top; from the scene camera's distance the square is a
  // small patch around the middle row.
  const auto redInTopQuarter = [](const QImage& image) {
    int red = 0;
    for (int y = 0; y < image.height() / 4; ++y) {
      for (int x = 0; x < image.width(); ++x) {
        red += isRed(image.pixel(x, y)) ? 1 : 0;
      }
    }
    return red;
  };
  EXPECT_GT(redInTopQuarter(throughSelected), 0);
  EXPECT_EQ(redInTopQuarter(throughSceneCamera), 0);

  // Choosing nothing: the photograph window says so.
  cameras->controller().clearSelection();
  EXPECT_TRUE(photograph->image().isNull());
  EXPECT_FALSE(photograph->message().isEmpty());
}

TEST_F(AppTest, AMissingPhotographIsSaidInWordsAndTheViewControlsSwitchTheMode) {
  const auto bundle = writeReconstruction(dir);
  std::filesystem::remove(dir / "images/photo.png");
  DocumentWindow& window = start({bundle});
  waitForImports();
  application->showCamerasPanel();
  application->showPhotographWindow();
  ASSERT_TRUE(application->camerasPanel()->controller().selectCameraAt({1, 0}));
  const QString message = application->photographWindow()->message();
  EXPECT_TRUE(message.contains(QStringLiteral("photo.png"))) << message.toStdString();
  EXPECT_TRUE(application->photographWindow()->image().isNull());

  application->showViewControls();
  ViewControlsPanel* controls = application->viewControls();
  QComboBox& mode = controls->viewMode();
  ASSERT_TRUE(QTest::qWaitForWindowExposed(controls));
  // The user picks "Anaglyph" from the list with the keyboard.
  mode.setFocus();
  mode.showPopup();
  QTest::keyClick(QApplication::focusWidget(), Qt::Key_Down);
  QTest::keyClick(QApplication::focusWidget(), Qt::Key_Down);
  QTest::keyClick(QApplication::focusWidget(), Qt::Key_Return);
  PointsDocumentGLView& view = window.glView().pointView();
  EXPECT_EQ(view.viewMode(), PointsDocumentGLView::kAnaglyph);
  EXPECT_TRUE(view.shouldDrawAnaglyph());
  // A key in the view changes the mode back; the panel follows.
  view.keyDown("~");
  EXPECT_EQ(mode.currentIndex(), PointsDocumentGLView::kNormal);
}

}  // namespace
}  // namespace cloudreel::app::test
