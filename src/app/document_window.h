#pragma once
// A document window: the OpenGL view of the document, the layers panel and
// the bucket controls beside it, and the menus. It shows the document's name
// and edited mark, tells the application when it becomes the main window and
// when it closes, and forwards every command to the core.

#include <QMainWindow>
#include <memory>

#include "scene/application_commands.h"
#include "scene/document_session.h"

class QCheckBox;
class QSlider;
class QTreeView;

namespace cloudreel::app {

class Application;
class GLViewWidget;
class LayerOutlineModel;

class DocumentWindow : public QMainWindow, public DocumentWindowController, public Observer {
  Q_OBJECT
 public:
  DocumentWindow(Application& application, std::shared_ptr<DocumentSession> session);
  ~DocumentWindow() override;

  const std::shared_ptr<DocumentSession>& session() const { return session_; }
  GLViewWidget& glView() { return *glView_; }
  QTreeView& layersView() { return *layersView_; }

  // --- DocumentWindowController
  std::shared_ptr<MyDocument> document() const override { return session_->document(); }
  void zoomIn() override;
  void zoomOut() override;

  // The name and the edited mark in the title bar.
  void updateTitle();
  // The panels read the document again (after a change or a revert).
  void refreshPanels();

  // File commands of this window's document.
  void save();
  void saveAs();
  void revert();

 protected:
  void changeEvent(QEvent* event) override;
  void closeEvent(QCloseEvent* event) override;

 private:
  void buildPanels();
  void followSelectedLayer();
  void layerClicked(const QModelIndex& index);

  Application& application_;
  std::shared_ptr<DocumentSession> session_;
  GLViewWidget* glView_ = nullptr;
  QTreeView* layersView_ = nullptr;
  std::unique_ptr<LayerOutlineModel> outline_;
  QCheckBox* overrideBuckets_ = nullptr;
  QSlider* bucketFraction_ = nullptr;
};

}  // namespace cloudreel::app
