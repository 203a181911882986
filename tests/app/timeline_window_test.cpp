// The timeline window driven as a person drives it: opened from the Window
// menu, a track added for the selected sphere's size, a control point's
// value set by editing at it, the cursor moved by clicks and keys showing
// the animation in the view, a span slid with Control held and the slide
// undone from the Edit menu, playback started and stopped, and a track
// removed from its context menu.

#include "app/timeline_window.h"

#include <QMenu>
#include <QTest>
#include <QTimer>
#include <QToolButton>

#include "app/app_fixture.h"
#include "app/gl_view_widget.h"
#include "app/timeline_view.h"
#include "scene/layer.h"
#include "scene/my_document.h"
#include "timeline/timeline.h"
#include "timeline/timeline_clip.h"
#include "timeline/timeline_track.h"

namespace cloudreel::app {
namespace {

using namespace test;

// Pixels that are not the view's background (the top-left pixel's colour).
int drawnPixels(const QImage& image) {
  const QRgb background = image.pixel(0, 0);
  int count = 0;
  for (int y = 0; y < image.height(); ++y) {
    for (int x = 0; x < image.width(); ++x) {
      count += image.pixel(x, y) != background ? 1 : 0;
    }
  }
  return count;
}

// What the view shows once it has settled: a shape whose size changed is
// recorded on the first frame after the change and drawn from the next.
int drawnPixelsOf(GLViewWidget& view) {
  view.grabFramebuffer();
  return drawnPixels(view.grabFramebuffer());
}

// Chooses the item of the popup menu that opens next.
void chooseFromNextPopup(const QString& title) {
  QTimer::singleShot(50, [title] {
    auto* menu = qobject_cast<QMenu*>(QApplication::activePopupWidget());
    ASSERT_NE(menu, nullptr);
    for (QAction* action : menu->actions()) {
      if (action->text() == title) {
        menu->close();
        action->trigger();
        return;
      }
    }
    menu->close();
    FAIL() << "no item " << title.toStdString();
  });
}

class TimelineWindowTest : public AppTest {
 protected:
  // The front document with one sphere, selected, and the timeline window
  // opened from the Window menu.
  TimelineWindow& open() {
    DocumentWindow& window = start();
    front = &window;
    application->commands().addPrimitive();
    QMenu* windowMenu = nullptr;
    QAction* item = menuItem(window, "Window", "Timeline", &windowMenu);
    EXPECT_NE(item, nullptr);
    item->trigger();
    TimelineWindow* timeline = application->timelineWindow();
    EXPECT_NE(timeline, nullptr);
    EXPECT_TRUE(QTest::qWaitForWindowExposed(timeline));
    // Its keys work while it is the active window.
    timeline->activateWindow();
    EXPECT_TRUE(QTest::qWaitForWindowActive(timeline));
    return *timeline;
  }
  std::shared_ptr<Timeline> timeline() { return front->document()->timeline(); }
  // Clicks the track area at a time on the row of track `index`.
  void clickAt(TimelineWindow& window, float seconds, int index,
               Qt::KeyboardModifiers modifiers = {}) {
    TimelineTrackArea& area = window.trackArea();
    QTest::mouseClick(&area, Qt::LeftButton, modifiers,
                      {area.xForTime(seconds), area.rowOfTrack(index).center().y()});
  }

  DocumentWindow* front = nullptr;
};

TEST_F(TimelineWindowTest, AnAnimationIsBuiltPlayedAndEditedInTheWindow) {
  TimelineWindow& window = open();
  const auto sphere = front->document()->selectedLayer();
  ASSERT_TRUE(sphere && sphere->className() == "Sphere");
  const auto size = [&] { return std::get<float>(sphere->valueForKey("size")); };

  // Add Track offers the sphere's size; choosing it gives the track its
  // default span from 0 to 20 s.
  const QString name =
      sphere->name().empty() ? QStringLiteral("Layer") : QString::fromStdString(sphere->name());
  chooseFromNextPopup(name + QStringLiteral(" ▸ Size"));
  QTest::mouseClick(&window.addTrackButton(), Qt::LeftButton);
  QTest::qWait(100);
  ASSERT_EQ(timeline()->tracks().size(), 2u);
  const auto track = timeline()->tracks()[1];
  EXPECT_EQ(track->managedKey(), "size");
  ASSERT_EQ(track->sequencedClips().size(), 3u);
  EXPECT_FLOAT_EQ(timeline()->totalLengthInSeconds(), 20.0f);

  // Alt-click near the end snaps the cursor to the control point at 20 s;
  // a double-click there starts editing it, and the size set meanwhile
  // (as any panel would) becomes its value.
  clickAt(window, 19.2f, 1, Qt::AltModifier);
  EXPECT_EQ(window.cursorLabelText(), "20.00 sec 500 fr");
  QTest::mouseDClick(
      &window.trackArea(), Qt::LeftButton, {},
      {window.trackArea().xForTime(20.0f), window.trackArea().rowOfTrack(1).center().y()});
  ASSERT_EQ(window.controller().editingClips().size(), 1u);
  sphere->setValueForKey(Value(4.0f), "size");

  // Moving the cursor ends the edit; the view shows the sphere growing.
  window.trackArea().setFocus();
  QTest::keyClick(&window, Qt::Key_Home);
  EXPECT_TRUE(window.controller().editingClips().empty());
  EXPECT_FLOAT_EQ(size(), 1.0f);
  const int small = drawnPixelsOf(front->glView());
  clickAt(window, 19.0f, 1);
  EXPECT_EQ(window.cursorLabelText(), "19.00 sec 475 fr");
  EXPECT_GT(size(), 3.5f);
  EXPECT_GT(drawnPixelsOf(front->glView()), small + 1000);
  QTest::keyClick(&window, Qt::Key_Right);
  EXPECT_EQ(window.cursorLabelText(), "19.04 sec 476 fr");
  QTest::keyClick(&window, Qt::Key_Left, Qt::ShiftModifier);
  EXPECT_EQ(window.cursorLabelText(), "18.64 sec 466 fr");

  // Marks from the keys.
  QTest::keyClick(&window, Qt::Key_I);
  EXPECT_FLOAT_EQ(timeline()->inPoint(), 18.64f);
  QTest::keyClick(&window, Qt::Key_O, Qt::AltModifier);
  EXPECT_FLOAT_EQ(timeline()->outPoint(), -1.0f);

  // Control-dragging the span one second later slides it with its control
  // points; Edit > Undo puts it back.
  window.trackArea().setPixelsPerSecond(50.0f);
  const int y = window.trackArea().rowOfTrack(1).center().y();
  front->document()->undoManager().closeEventGroup();
  drag(window.trackArea(), Qt::LeftButton, {window.trackArea().xForTime(5.0f), y},
       {window.trackArea().xForTime(6.0f), y});
  // A plain drag scrubs the cursor and moves nothing.
  EXPECT_NEAR(window.controller().cursor(), 6.0f, 0.05f);
  EXPECT_FLOAT_EQ(track->sequencedClips()[0]->begin(), 0.0f);
  QTest::mousePress(&window.trackArea(), Qt::LeftButton, Qt::ControlModifier,
                    {window.trackArea().xForTime(5.0f), y});
  QMouseEvent move(QEvent::MouseMove, QPointF(window.trackArea().xForTime(6.0f), y),
                   window.trackArea().mapToGlobal(QPointF(window.trackArea().xForTime(6.0f), y)),
                   Qt::NoButton, Qt::LeftButton, Qt::ControlModifier);
  QApplication::sendEvent(&window.trackArea(), &move);
  QTest::mouseRelease(&window.trackArea(), Qt::LeftButton, Qt::ControlModifier,
                      {window.trackArea().xForTime(6.0f), y});
  EXPECT_FLOAT_EQ(track->sequencedClips()[0]->begin(), 1.0f);
  EXPECT_FLOAT_EQ(track->sequencedClips()[2]->begin(), 21.0f);
  front->document()->undoManager().closeEventGroup();
  QMenu* editMenu = nullptr;
  QAction* undo = menuItem(*front, "Edit", "Undo", &editMenu);
  ASSERT_NE(undo, nullptr);
  openMenu(editMenu);
  EXPECT_EQ(undo->text(), "Undo Slide Clip");
  undo->trigger();
  EXPECT_FLOAT_EQ(track->sequencedClips()[0]->begin(), 0.0f);
  EXPECT_FLOAT_EQ(track->sequencedClips()[2]->begin(), 20.0f);

  // Space plays, K stops.
  QTest::keyClick(&window, Qt::Key_Home);
  QTest::keyClick(&window, Qt::Key_Space);
  EXPECT_TRUE(window.controller().isAnimating());
  EXPECT_TRUE(QTest::qWaitFor([&] { return window.controller().cursor() > 0.1f; }, 5000));
  QTest::keyClick(&window, Qt::Key_K);
  EXPECT_FALSE(window.controller().isAnimating());

  // The track's menu removes it; Edit > Undo brings it back.
  chooseFromNextPopup(QStringLiteral("Remove"));
  const QPoint at(window.trackArea().xForTime(3.0f), y);
  QContextMenuEvent menuEvent(QContextMenuEvent::Mouse, at, window.trackArea().mapToGlobal(at));
  QApplication::sendEvent(&window.trackArea(), &menuEvent);
  EXPECT_EQ(timeline()->tracks().size(), 1u);
  front->document()->undoManager().closeEventGroup();
  undo->trigger();
  EXPECT_EQ(timeline()->tracks().size(), 2u);
}

}  // namespace
}  // namespace cloudreel::app
