// Rendering from the desktop application as a person does it: the settings
// sheet filled in with the mouse and keyboard, the progress sheet shown
// while the timeline's frames are written (the same frames the command line
// renders from the saved document) and its cancel stopping the run,
// the spline editor's knots placed and dragged, and a camera path rendered
// from the Layer menu.

#include "app/render_sheets.h"

#include <gtest/gtest.h>

#include <QApplication>
#include <QComboBox>
#include <QDialogButtonBox>
#include <QLabel>
#include <QLineEdit>
#include <QPointer>
#include <QProgressBar>
#include <QPushButton>
#include <QScopeGuard>
#include <QSpinBox>
#include <QTest>
#include <QTimer>
#include <cmath>
#include <set>
#include <string>
#include <vector>

#include "app/app_fixture.h"
#include "app/spline_editor_window.h"
#include "scene/document_session.h"
#include "camera/zxy_camera_path.h"
#include "render/frame_pattern.h"
#include "render/gl/image_file.h"
#include "scene/my_document.h"
#include "support/cli_runner.h"
#include "timeline/spline.h"
#include "timeline/timeline.h"
#include "timeline/timeline_window_controller.h"

namespace cloudreel::app {
namespace {

using namespace test;
namespace fs = std::filesystem;

std::set<std::string> framesNamed(int first, int last) {
  std::set<std::string> names;
  for (int i = first; i <= last; ++i) {
    names.insert(FramePattern::parse("output_%04d.tiff")->format(i));
  }
  return names;
}

void typeInto(QSpinBox* box, const QString& text) {
  ASSERT_NE(box, nullptr);
  box->setFocus();
  box->selectAll();
  QTest::keyClicks(box, text);
}

// Follows a document's timeline for as long as it lives, and lets go of the
// document before the test does.
class RenderSheetsTest : public AppTest {
 protected:
  DocumentWindow& startWithSquare(std::int32_t fps) {
    writeRedSquare(dir / "square.ply");
    DocumentWindow& window = start({dir / "square.ply"});
    waitForImports();
    window.document()->timeline()->setFps(fps);
    timeline.setDocument(window.document().get());
    return window;
  }
  void TearDown() override {
    timeline.setDocument(nullptr);
    AppTest::TearDown();
  }

  // Fills the open settings sheet: a preset, then a size typed over it, and
  // the folder (typed, or through the chooser when `typed` is false).
  void fillSettingsSheet(const fs::path& folder, bool typed) {
    auto* sheet = qobject_cast<RenderSettingsSheet*>(QApplication::activeModalWidget());
    ASSERT_NE(sheet, nullptr);
    auto cancel = qScopeGuard([&] { sheet->reject(); });
    auto* presets = sheet->findChild<QComboBox*>(QStringLiteral("presets"));
    auto* width = sheet->findChild<QSpinBox*>(QStringLiteral("width"));
    auto* height = sheet->findChild<QSpinBox*>(QStringLiteral("height"));
    ASSERT_TRUE(presets && width && height);
    EXPECT_EQ(presets->count(), 11);
    EXPECT_EQ(width->value(), 1440);
    // Two steps down the menu: "480p".
    presets->setFocus();
    QTest::keyClick(presets, Qt::Key_Down);
    QTest::keyClick(presets, Qt::Key_Down);
    EXPECT_EQ(width->value(), 720);
    EXPECT_EQ(height->value(), 480);
    typeInto(width, QStringLiteral("64"));
    typeInto(height, QStringLiteral("48"));

    auto* path = sheet->findChild<QLineEdit*>(QStringLiteral("outputPath"));
    ASSERT_NE(path, nullptr);
    if (typed) {
      path->selectAll();
      QTest::keyClicks(path, QString::fromStdString(folder.string()));
    } else {
      user->answerOpenPanelWith(folder.string());
      QTest::mouseClick(sheet->findChild<QPushButton*>(QStringLiteral("chooseFolder")),
                        Qt::LeftButton);
      ASSERT_EQ(user->panels.size(), 1u);
      EXPECT_TRUE(user->panels[0].canChooseDirectories);
    }
    EXPECT_EQ(path->text().toStdString(), folder.string());
    auto* buttons = sheet->findChild<QDialogButtonBox*>();
    ASSERT_NE(buttons, nullptr);
    cancel.dismiss();
    QTest::mouseClick(buttons->button(QDialogButtonBox::Ok), Qt::LeftButton);
  }

  TimelineWindowController timeline;
};

TEST_F(RenderSheetsTest, TheSettingsSheetRendersEveryFrameOfTheTimelineIntoTheChosenFolder) {
  DocumentWindow& window = startWithSquare(4);  // one second: frames 0 to 4
  const fs::path folder = dir / "frames";       // not there yet: the sheet makes it
  // The folder starts at the default, and Cancel renders nothing.
  UserDefaults::standardUserDefaults().setObjectForKey(folder.string(), "KTImageSavePath");
  QString shownFolder;
  QTimer::singleShot(0, [&] {
    auto* sheet = QApplication::activeModalWidget();
    ASSERT_NE(sheet, nullptr);
    shownFolder = sheet->findChild<QLineEdit*>(QStringLiteral("outputPath"))->text();
    sheet->findChild<QDialogButtonBox*>()->button(QDialogButtonBox::Cancel)->click();
  });
  EXPECT_EQ(runTimelineRender(&window, timeline), nullptr);
  EXPECT_EQ(shownFolder.toStdString(), folder.string());
  EXPECT_FALSE(fs::exists(folder));

  UserDefaults::standardUserDefaults().setObjectForKey(dir.path().string(), "KTImageSavePath");
  QTimer::singleShot(0, [&] { fillSettingsSheet(folder, false); });
  const QPointer<RenderProgressSheet> progress = runTimelineRender(&window, timeline);
  ASSERT_FALSE(progress.isNull());
  EXPECT_TRUE(progress->isVisible());
  EXPECT_TRUE(QTest::qWaitFor([&] { return progress.isNull(); }, 60000));
  EXPECT_EQ(testing::fileNamesIn(folder), framesNamed(0, 4));

  // The frames have the size typed, and the red square lies right of the
  // middle as the scene camera sees it.
  Error error;
  const auto frame = gl::readTiff(folder / "output_0002.tiff", &error);
  ASSERT_TRUE(frame) << error.message;
  EXPECT_EQ(frame->width, 64);
  EXPECT_EQ(frame->height, 48);
  int redLeft = 0, redRight = 0;
  for (int y = 0; y < frame->height; ++y) {
    for (int x = 0; x < frame->width; ++x) {
      if (isRed(qRgb(frame->sample(x, y, 0), frame->sample(x, y, 1), frame->sample(x, y, 2)))) {
        (x < frame->width / 2 ? redLeft : redRight) += 1;
      }
    }
  }
  EXPECT_EQ(redLeft, 0);
  EXPECT_GT(redRight, 0);

  // The saved document rendered by the command line gives the same frames.
  Error saveError;
  ASSERT_TRUE(window.session()->saveToURL(dir / "square.reel", &saveError)) << saveError.message;
  const auto run = testing::runProgram(dir.path(), {CLOUDREEL_BINARY, "render", "square.reel",
                                                    "--out", "cli", "--size", "64x48"});
  ASSERT_EQ(run.status, 0) << run.err;
  ASSERT_EQ(testing::fileNamesIn(dir / "cli"), framesNamed(0, 4));
  for (const std::string& name : framesNamed(0, 4)) {
    const auto fromSheet = gl::readTiff(folder / name);
    const auto fromCommand = gl::readTiff(dir / "cli" / name);
    ASSERT_TRUE(fromSheet && fromCommand);
    EXPECT_EQ(fromSheet->samples, fromCommand->samples) << name;
  }
}

TEST_F(RenderSheetsTest, CancellingStopsTheRunAfterTheFrameInFlightAndMarksNeedSetting) {
  DocumentWindow& window = startWithSquare(25);  // frames 0 to 25
  const fs::path folder = dir / "cancelled";
  QTimer::singleShot(0, [&] { fillSettingsSheet(folder, true); });
  const QPointer<RenderProgressSheet> progress = runTimelineRender(&window, timeline);
  ASSERT_FALSE(progress.isNull());
  // Cancel as soon as the bar first moves, at frame 1: that frame is still
  // drawn and written, and the run stops before frame 2.
  auto* bar = progress->findChild<QProgressBar*>();
  auto* cancel = progress->findChild<QPushButton*>();
  auto* label = progress->findChild<QLabel*>();
  ASSERT_TRUE(bar && cancel && label);
  std::vector<std::string> labels;
  QObject::connect(bar, &QProgressBar::valueChanged, [&](int value) {
    labels.push_back(label->text().toStdString());
    if (value > 0 && cancel->isEnabled()) {
      QTest::mouseClick(cancel, Qt::LeftButton);
    }
  });
  EXPECT_TRUE(QTest::qWaitFor([&] { return progress.isNull(); }, 60000));
  EXPECT_EQ(testing::fileNamesIn(folder), framesNamed(0, 1));
  ASSERT_FALSE(labels.empty());
  EXPECT_EQ(labels.front(), "frame 1 of 25");

  // The marked range without both marks is refused with a message, and
  // nothing starts.
  window.document()->timeline()->setInPoint(0.2f);
  QTimer::singleShot(0, [&] {
    auto* sheet = QApplication::activeModalWidget();
    ASSERT_NE(sheet, nullptr);
    QTest::mouseClick(sheet->findChild<QWidget*>(QStringLiteral("rangeMarks")), Qt::LeftButton);
    sheet->findChild<QDialogButtonBox*>()->button(QDialogButtonBox::Ok)->click();
  });
  UserDefaults::standardUserDefaults().setObjectForKey((dir / "marked").string(),
                                                       "KTImageSavePath");
  EXPECT_EQ(runTimelineRender(&window, timeline), nullptr);
  ASSERT_EQ(user->alerts.size(), 1u);
  EXPECT_NE(user->alerts[0].informativeText.find("set both the in and the out mark"),
            std::string::npos);
  EXPECT_TRUE(testing::fileNamesIn(dir / "marked").empty());
}

TEST_F(AppTest, TheSplineEditorInsertsDragsAndDeletesKnotsWithTheMouse) {
  DocumentWindow& window = start();
  const auto spline = std::make_shared<Spline>();
  int edits = 0;
  const QPointer<SplineEditorWindow> editor =
      SplineEditorWindow::openOnSpline(spline, &window, [&] { ++edits; });
  editor->resize(320, 360);
  ASSERT_TRUE(QTest::qWaitForWindowExposed(editor.data()));
  SplineEditorView& view = editor->view();
  const auto at = [&](double x, double y) {
    return view.viewPointForSplinePoint({x, y}).toPoint();
  };
  const auto moveTo = [&](QPoint to) {
    QMouseEvent move(QEvent::MouseMove, to, view.mapToGlobal(to), Qt::NoButton, Qt::LeftButton,
                     Qt::NoModifier);
    QApplication::sendEvent(&view, &move);
  };
  // Within a pixel of the square's size.
  const double pixel = 1.5 / (view.width() - 20);
  const auto near = [pixel](Point2D p, double x, double y) {
    return std::abs(p.x - x) <= pixel && std::abs(p.y - y) <= pixel;
  };

  // A click in empty space, low in the square, puts a knot there: y counts
  // upwards.
  QTest::mousePress(&view, Qt::LeftButton, {}, at(0.5, 0.2));
  ASSERT_EQ(spline->points().size(), 3u);
  EXPECT_TRUE(near(spline->points()[1]->point(), 0.5, 0.2));
  // Dragging it carries it along, and the curve passes through it.
  moveTo(at(0.6, 0.4));
  moveTo(at(0.7, 0.6));
  QTest::mouseRelease(&view, Qt::LeftButton, {}, at(0.7, 0.6));
  ASSERT_EQ(spline->points().size(), 3u);
  const Point2D knot = spline->points()[1]->point();
  EXPECT_TRUE(near(knot, 0.7, 0.6));
  EXPECT_FLOAT_EQ(spline->valueForTime(static_cast<float>(knot.x)), static_cast<float>(knot.y));
  EXPECT_EQ(edits, 1);

  // The right handle of the first knot, 0.1 up and right of it, follows a
  // drag of its own; the knot stays.
  QTest::mousePress(&view, Qt::LeftButton, {}, at(0.1, 0.1));
  moveTo(at(0.1, 0.5));
  QTest::mouseRelease(&view, Qt::LeftButton, {}, at(0.1, 0.5));
  EXPECT_TRUE(near(spline->points()[0]->rightTangent(), 0.1, 0.5));
  EXPECT_EQ(spline->points()[0]->point(), (Point2D{0.0, 0.0}));

  // Released left of the square, the knot is gone.
  QTest::mousePress(&view, Qt::LeftButton, {}, at(knot.x, knot.y));
  moveTo(at(0.3, 0.5));
  moveTo(at(-0.1, 0.5));
  QTest::mouseRelease(&view, Qt::LeftButton, {}, at(-0.1, 0.5));
  EXPECT_EQ(spline->points().size(), 2u);
  EXPECT_EQ(edits, 3);

  editor->close();
  EXPECT_TRUE(QTest::qWaitFor([&] { return editor.isNull(); }));
}

TEST_F(AppTest, TheLayerMenuRendersTheSelectedCameraPathAndSaysWhere) {
  DocumentWindow& window = start();
  QMenu* layerMenu = nullptr;
  QAction* render = menuItem(window, "Layer", "Render Camera Path", &layerMenu);
  ASSERT_NE(render, nullptr);
  openMenu(layerMenu);
  EXPECT_FALSE(render->isEnabled());

  const fs::path folder = dir / "shots";
  fs::create_directories(folder);
  UserDefaults::standardUserDefaults().setObjectForKey(folder.string(), "KTImageSavePath");
  const auto path = ZXYCameraPath::initWithText("2\n0 0 15 0 0 0\n0 0 14 0 0 0\n");
  ASSERT_TRUE(path);
  window.document()->addLayer(path);
  window.document()->setSelectedLayer(path);
  openMenu(layerMenu);
  ASSERT_TRUE(render->isEnabled());
  render->trigger();
  EXPECT_EQ(testing::fileNamesIn(folder),
            (std::set<std::string>{"out_0000.tiff", "out_0001.tiff"}));
  ASSERT_EQ(user->alerts.size(), 1u);
  EXPECT_EQ(user->alerts[0].messageText, "Rendered 2 frames");
  EXPECT_NE(user->alerts[0].informativeText.find(folder.string()), std::string::npos);
  EXPECT_EQ(QApplication::overrideCursor(), nullptr);
}

}  // namespace
}  // namespace cloudreel::app
