#pragma once
// The floating cameras panel: the front document's scene camera and camera
// fields with their cameras, as CameraPanelController lists them. Choosing
// a row selects that camera.

#include <QStringList>
#include <QWidget>

#include "scene/camera_panel_controller.h"

class QTreeWidget;
class QTreeWidgetItem;

namespace cloudreel::app {

class CamerasPanel : public QWidget {
  Q_OBJECT
 public:
  explicit CamerasPanel(std::shared_ptr<MyDocument> frontDocument, QWidget* parent = nullptr);

  CameraPanelController& controller() { return controller_; }
  QTreeWidget& tree() { return *tree_; }
  // The row of a camera, for the tests' clicks; null when not listed.
  QTreeWidgetItem* itemFor(CameraPanelController::Position position) const;

 private:
  void reload();
  void currentItemChanged(QTreeWidgetItem* item);

  CameraPanelController controller_;
  QTreeWidget* tree_ = nullptr;
  // The titles last shown: the rows are rebuilt only when these change, so
  // that a selection (which reports a document change) keeps the items.
  QStringList shownTitles_;
};

}  // namespace cloudreel::app
