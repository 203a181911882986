#pragma once
// The floating camera paths panel: the front document's stored camera
// paths, its transform stacks and the chosen stack's members with their
// gain and switches, as CameraPathsPanelController offers them.

#include <QWidget>

#include "scene/camera_paths_panel_controller.h"

class QCheckBox;
class QDoubleSpinBox;
class QListWidget;
class QPushButton;

namespace cloudreel::app {

class PathsPanel : public QWidget {
  Q_OBJECT
 public:
  explicit PathsPanel(std::shared_ptr<MyDocument> frontDocument, QWidget* parent = nullptr);

  CameraPathsPanelController& controller() { return controller_; }
  QListWidget& pathList() { return *paths_; }
  QListWidget& stackList() { return *stacks_; }
  QListWidget& memberList() { return *members_; }
  QDoubleSpinBox& gain() { return *gain_; }

 private:
  void reload();
  void showMember();
  std::optional<std::size_t> currentMember() const;
  void setMemberValue(CameraPathsPanelController::MemberValue which, const Value& value);

  CameraPathsPanelController controller_;
  QListWidget* paths_ = nullptr;
  QListWidget* stacks_ = nullptr;
  QListWidget* members_ = nullptr;
  QDoubleSpinBox* gain_ = nullptr;
  QCheckBox* enableRotation_ = nullptr;
  QCheckBox* enableTranslation_ = nullptr;
  QCheckBox* invertRotation_ = nullptr;
  QCheckBox* invertTranslation_ = nullptr;
  QWidget* memberEditor_ = nullptr;
  bool reloading_ = false;
};

}  // namespace cloudreel::app
