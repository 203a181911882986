#pragma once
// The preferences window: a colour well for each display colour and the two
// folders (rendered images, point cache). The choices go to the core's
// PreferenceController, which stores them and tells the documents.

#include <QWidget>
#include <array>

#include "scene/application_commands.h"

class QLabel;
class QPushButton;

namespace cloudreel::app {

class PreferencesWindow : public QWidget {
  Q_OBJECT
 public:
  PreferencesWindow();

 private:
  void showWells();
  void showFolders();
  void chooseColor(PreferenceController::Well well);

  PreferenceController controller_;
  std::array<QPushButton*, 5> wells_{};
  QLabel* imageFolder_ = nullptr;
  QLabel* cacheFolder_ = nullptr;
};

}  // namespace cloudreel::app
