#pragma once
// The import commands' options inside their open panel: one page of
// controls per file kind (point file, reconstruction, PLY, picture card), switched as the
// panel's selection changes. The controls read and write the import options
// in the user defaults as they change, so the command that runs when the
// panel closes reads what the user left.

#include <QWidget>
#include <filesystem>
#include <functional>

#include "scene/application_commands.h"

class QCheckBox;
class QFileDialog;
class QSpinBox;
class QStackedWidget;

namespace cloudreel::app {

class ImportOptionsPanel : public QWidget {
  Q_OBJECT
 public:
  using ViewForSelection = std::function<ImportOptionsView(const std::filesystem::path&)>;

  explicit ImportOptionsPanel(ViewForSelection viewForSelection, QWidget* parent = nullptr);

  // Puts the panel below the dialog's own controls (Qt's own dialog: a
  // platform one has no room for them) and follows its selection.
  void attachTo(QFileDialog& dialog);
  void showOptionsForSelection(const std::filesystem::path& selected);
  ImportOptionsView shownView() const { return shown_; }

 private:
  QWidget* pointFilePage();
  QWidget* bundlerPage();
  QWidget* plyPage();
  QWidget* cardPage();

  ViewForSelection viewForSelection_;
  ImportOptionsView shown_ = ImportOptionsView::None;
  QStackedWidget* pages_ = nullptr;
  QCheckBox* linkPointFile_ = nullptr;
  QCheckBox* linkBundle_ = nullptr;
  QCheckBox* plyDownsample_ = nullptr;
  QSpinBox* plyFactor_ = nullptr;
};

}  // namespace cloudreel::app
