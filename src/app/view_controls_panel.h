#pragma once
// The floating view controls: the front window's view mode, anaglyph
// glasses, eye separation and camera, and the playback of a camera path in
// that view, as ViewControlsController offers them; "Render" writes the
// chosen path's frames through the application's camera-path render.

#include <QWidget>

#include "platform/notification_center.h"
#include "render/view_controls_controller.h"

class QCheckBox;
class QComboBox;
class QDoubleSpinBox;
class QLabel;
class QPushButton;

namespace cloudreel::app {

class Application;

class ViewControlsPanel : public QWidget {
  Q_OBJECT
 public:
  explicit ViewControlsPanel(Application& application, QWidget* parent = nullptr);
  ~ViewControlsPanel() override;

  ViewControlsController& controller() { return controller_; }
  QComboBox& viewMode() { return *viewMode_; }
  QComboBox& cameraMode() { return *cameraMode_; }
  QComboBox& paths() { return *paths_; }
  QPushButton& playButton() { return *play_; }

 private:
  // Follows the application's main window's view.
  void followMainWindow();
  void reload();

  Application& application_;
  ViewControlsController controller_;
  // Hears the document windows' activations, to take the new front view.
  Observer activation_;
  QComboBox* viewMode_ = nullptr;
  QComboBox* glasses_ = nullptr;
  QDoubleSpinBox* eyeSeparation_ = nullptr;
  QComboBox* cameraMode_ = nullptr;
  QComboBox* paths_ = nullptr;
  QDoubleSpinBox* fps_ = nullptr;
  QCheckBox* loop_ = nullptr;
  QPushButton* play_ = nullptr;
  QPushButton* stop_ = nullptr;
  QPushButton* step_ = nullptr;
  QPushButton* render_ = nullptr;
  QLabel* frame_ = nullptr;
  bool reloading_ = false;
};

}  // namespace cloudreel::app
