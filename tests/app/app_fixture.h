#pragma once
// What the desktop application's tests share: a fixture that starts the
// application with scripted answers to its questions, and the gestures and
// pictures the tests use (drags, menus as the user opens them, clicks in a
// file dialog, red pixels counted).

#include <gtest/gtest.h>

#include <QAction>
#include <QApplication>
#include <QFileDialog>
#include <QImage>
#include <QListView>
#include <QMainWindow>
#include <QMenu>
#include <QMenuBar>
#include <QMouseEvent>
#include <QTest>
#include <array>
#include <filesystem>
#include <memory>
#include <utility>
#include <vector>

#include "app/application.h"
#include "app/document_window.h"
#include "camera/camera.h"
#include "geometry/affine_transform.h"
#include "platform/user_defaults.h"
#include "platform/user_interaction.h"
#include "support/memory_defaults.h"
#include "support/ply_text.h"
#include "support/scripted_user_interaction.h"
#include "support/temp_dir.h"

namespace cloudreel::app::test {

using cloudreel::testing::TempDir;

// A square of bright red points at x 2..3, right of where the default scene
// camera (15 units along +z, looking at the origin) looks.
inline void writeRedSquare(const std::filesystem::path& path) {
  cloudreel::testing::PlyElement vertex{"vertex", cloudreel::testing::kPlyXyzRgb, {}};
  for (int i = 0; i < 40; ++i) {
    for (int j = 0; j < 40; ++j) {
      vertex.instances.push_back({2.0 + i / 40.0, -0.5 + j / 40.0, 0.0, 255.0, 0.0, 0.0});
    }
  }
  cloudreel::testing::writeFile(path,
                                cloudreel::testing::plyText({vertex}, "binary_little_endian"));
}

inline bool isRed(QRgb pixel) {
  return qRed(pixel) > 150 && qGreen(pixel) < 80 && qBlue(pixel) < 80;
}

// Red pixels in the left 45% of the picture and in its right 30% (the red
// x axis drawn from the middle ends between the two).
inline std::pair<int, int> redPixelsLeftAndRight(const QImage& image) {
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

inline QAction* menuItem(QMainWindow& window, const QString& menuTitle, const QString& itemTitle,
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
inline std::array<double, 6> pose(const Camera& camera) {
  const AffineTransform& m = *camera.objectToWorld();
  const auto z = m.basisVectorZ();
  return {m.translationX(), m.translationY(), m.translationZ(), z->x(), z->y(), z->z()};
}

// A menu as it is when the user opens it.
inline void openMenu(QMenu* menu) { emit menu->aboutToShow(); }

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

  cloudreel::testing::MemoryDefaults defaults;
  TempDir dir;
  std::shared_ptr<cloudreel::testing::ScriptedUserInteraction> user =
      std::make_shared<cloudreel::testing::ScriptedUserInteraction>();
  std::unique_ptr<Application> application;

 private:
  std::shared_ptr<UserInteraction> previousUser_;
};

// A drag from one point to another with the given button held.
inline void drag(QWidget& widget, Qt::MouseButton button, QPoint from, QPoint to) {
  QTest::mousePress(&widget, button, {}, from);
  for (int step = 1; step <= 10; ++step) {
    const QPointF at = from + (to - from) * step / 10.0;
    QMouseEvent move(QEvent::MouseMove, at, widget.mapToGlobal(at), Qt::NoButton, button,
                     Qt::NoModifier);
    QApplication::sendEvent(&widget, &move);
  }
  QTest::mouseRelease(&widget, button, {}, to);
}

// Clicks the file of that name in an open panel's list, once the panel has
// read its folder.
inline bool clickFile(QFileDialog& dialog, const QString& name) {
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

}  // namespace cloudreel::app::test
