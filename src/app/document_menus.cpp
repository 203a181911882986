#include "app/document_menus.h"

#include <QActionGroup>
#include <QInputDialog>
#include <QMenu>
#include <QMenuBar>
#include <functional>

#include "app/application.h"
#include "app/document_window.h"
#include "app/gl_view_widget.h"
#include "camera/camera_path.h"
#include "platform/user_interaction.h"
#include "scene/layer.h"

namespace cloudreel::app {

namespace {

// The property of QAction that holds the core's action name, the key of
// menu validation.
constexpr const char* kActionNameProperty = "cloudreelAction";
// Marks an item a menu disables as it opens and enables again as it closes.
constexpr const char* kValidatedProperty = "cloudreelValidated";

void markValidated(std::initializer_list<QAction*> actions) {
  for (QAction* action : actions) {
    action->setProperty(kValidatedProperty, true);
  }
}

QAction* addItem(QMenu* menu, const QString& title, std::function<void()> run,
                 const QKeySequence& shortcut = {}, std::string_view actionName = {}) {
  QAction* action = menu->addAction(title);
  action->setShortcut(shortcut);
  if (!actionName.empty()) {
    action->setProperty(kActionNameProperty,
                        QString::fromUtf8(actionName.data(), static_cast<int>(actionName.size())));
    markValidated({action});
  }
  QObject::connect(action, &QAction::triggered, menu, [run = std::move(run)] { run(); });
  return action;
}

// Items that carry a core action name are enabled as the commands say.
void validateOnShow(QMenu* menu, Application& application) {
  QObject::connect(menu, &QMenu::aboutToShow, menu, [menu, &application] {
    for (QAction* action : menu->actions()) {
      const QVariant name = action->property(kActionNameProperty);
      if (name.isValid()) {
        action->setEnabled(application.commands().validateMenuItem(name.toString().toStdString()));
      }
    }
  });
}

// A group of checkable items for the values 0..n-1 of a view property.
void addChoiceItems(QMenu* menu, const QStringList& titles, std::function<int()> current,
                    std::function<void(int)> choose, int firstValue = 0) {
  auto* group = new QActionGroup(menu);
  std::vector<QAction*> items;
  for (int i = 0; i < titles.size(); ++i) {
    QAction* action = menu->addAction(titles[i]);
    action->setCheckable(true);
    group->addAction(action);
    const int value = firstValue + i;
    QObject::connect(action, &QAction::triggered, menu, [choose, value] { choose(value); });
    items.push_back(action);
  }
  QObject::connect(menu, &QMenu::aboutToShow, menu, [items, current, firstValue] {
    const int value = current() - firstValue;
    for (int i = 0; i < static_cast<int>(items.size()); ++i) {
      items[static_cast<std::size_t>(i)]->setChecked(i == value);
    }
  });
}

void buildFileMenu(QMenuBar* bar, DocumentWindow& window, Application& application) {
  QMenu* file = bar->addMenu(QStringLiteral("&File"));
  addItem(
      file, QStringLiteral("New"), [&application] { application.newDocument(); },
      QKeySequence::New);
  addItem(
      file, QStringLiteral("Open…"), [&application] { application.openDocumentWithPanel(); },
      QKeySequence::Open);
  QMenu* recent = file->addMenu(QStringLiteral("Open Recent"));
  QObject::connect(recent, &QMenu::aboutToShow, recent, [recent, &application] {
    recent->clear();
    for (const auto& path : application.recentDocuments()) {
      addItem(recent, QString::fromStdString(path.filename().string()),
              [&application, path] { application.openFile(path); });
    }
    recent->addSeparator();
    addItem(recent, QStringLiteral("Clear Menu"),
            [&application] { application.clearRecentDocuments(); });
  });
  file->addSeparator();
  addItem(
      file, QStringLiteral("Close"), [&window] { window.close(); }, QKeySequence::Close);
  addItem(
      file, QStringLiteral("Save"), [&window] { window.save(); }, QKeySequence::Save);
  addItem(
      file, QStringLiteral("Save As…"), [&window] { window.saveAs(); },
      QKeySequence(QStringLiteral("Ctrl+Shift+S")));
  QAction* revert =
      addItem(file, QStringLiteral("Revert to Saved"), [&window] { window.revert(); });
  markValidated({revert});
  QObject::connect(file, &QMenu::aboutToShow, file, [revert, &window] {
    revert->setEnabled(window.session()->fileURL().has_value() &&
                       window.session()->isDocumentEdited());
  });
  file->addSeparator();
  QMenu* import = file->addMenu(QStringLiteral("Import"));
  ApplicationCommands& commands = application.commands();
  addItem(
      import, QStringLiteral("Point File…"), [&commands] { commands.importPointFile(); },
      QKeySequence(QStringLiteral("Ctrl+I")));
  addItem(import, QStringLiteral("RWB File…"), [&commands] { commands.importRWB(); });
  addItem(import, QStringLiteral("PLY File…"), [&application] {
    if (application.commands().importPLY()) {
      application.runPLYOptionsSheet();
    }
  });
  addItem(import, QStringLiteral("Bundler Reconstruction…"),
          [&commands] { commands.importBundler(); });
  addItem(import, QStringLiteral("Camera Path (ZXY)…"),
          [&commands] { commands.importCameraPath(); });
  addItem(import, QStringLiteral("Camera Path (Matrices)…"),
          [&commands] { commands.importMatrixPath(); });
  file->addSeparator();
  addItem(
      file, QStringLiteral("Preferences…"), [&application] { application.showPreferences(); },
      QKeySequence::Preferences);
  addItem(
      file, QStringLiteral("Quit"), [&application] { application.terminate(); },
      QKeySequence::Quit);
}

void buildEditMenu(QMenuBar* bar, DocumentWindow& window) {
  QMenu* edit = bar->addMenu(QStringLiteral("&Edit"));
  UndoManager& undo = window.document()->undoManager();
  // The document reports what an undo or redo changed; the panels follow.
  QAction* undoItem = addItem(
      edit, QStringLiteral("Undo"), [&undo] { undo.undo(); }, QKeySequence::Undo);
  QAction* redoItem = addItem(
      edit, QStringLiteral("Redo"), [&undo] { undo.redo(); }, QKeySequence::Redo);
  markValidated({undoItem, redoItem});
  QObject::connect(edit, &QMenu::aboutToShow, edit, [undoItem, redoItem, &undo] {
    undoItem->setText(QString::fromStdString(menuItemTitleForStep("Undo", undo.undoActionName())));
    undoItem->setEnabled(undo.canUndo());
    redoItem->setText(QString::fromStdString(menuItemTitleForStep("Redo", undo.redoActionName())));
    redoItem->setEnabled(undo.canRedo());
  });
}

void buildViewMenu(QMenuBar* bar, DocumentWindow& window, Application& application) {
  QMenu* viewMenu = bar->addMenu(QStringLiteral("&View"));
  PointsDocumentGLView& view = window.glView().pointView();
  addChoiceItems(
      viewMenu,
      {QStringLiteral("Perspective"), QStringLiteral("Orthographic"), QStringLiteral("Anaglyph")},
      [&view] { return view.viewMode(); }, [&view](int v) { view.setViewMode(v); });
  viewMenu->actions()[0]->setShortcut(QKeySequence(QStringLiteral("Ctrl+1")));
  viewMenu->actions()[1]->setShortcut(QKeySequence(QStringLiteral("Ctrl+2")));
  viewMenu->actions()[2]->setShortcut(QKeySequence(QStringLiteral("Ctrl+3")));
  viewMenu->addSeparator();

  QMenu* camera = viewMenu->addMenu(QStringLiteral("Camera"));
  addChoiceItems(
      camera,
      {QStringLiteral("Scene Camera"), QStringLiteral("Camera Path or Trackball"),
       QStringLiteral("Selected Camera"), QStringLiteral("Trackball")},
      [&view] { return view.cameraMode(); }, [&view](int v) { view.setCameraMode(v); });
  QMenu* presets = viewMenu->addMenu(QStringLiteral("Orthographic View"));
  QStringList presetTitles;
  for (int axis = 0; axis < 6; ++axis) {
    presetTitles << QString::fromUtf8(PointsDocumentGLView::labelForOrthoAxis(axis).data());
  }
  addChoiceItems(
      presets, presetTitles,
      [&view] {
        return view.viewMode() == PointsDocumentGLView::kOrthographic ? view.orthoAxis() : -1;
      },
      [&view](int axis) { view.cameraPreset(axis); });
  QMenu* glasses = viewMenu->addMenu(QStringLiteral("Anaglyph Glasses"));
  addChoiceItems(
      glasses,
      {QStringLiteral("Red / Blue"), QStringLiteral("Red / Green"), QStringLiteral("Red / Cyan"),
       QStringLiteral("Blue / Red"), QStringLiteral("Green / Red"), QStringLiteral("Cyan / Red")},
      [&view] { return view.glassesType(); }, [&view](int v) { view.setGlassesType(v); }, 1);
  QMenu* editing = viewMenu->addMenu(QStringLiteral("Mouse Edits"));
  addChoiceItems(
      editing,
      {QStringLiteral("The View"), QStringLiteral("The Selected Layer"),
       QStringLiteral("The Light")},
      [&view] { return view.editMode(); }, [&view](int v) { view.setEditMode(v); });
  viewMenu->addSeparator();

  ApplicationCommands& commands = application.commands();
  addItem(
      viewMenu, QStringLiteral("Zoom In"), [&commands] { commands.menuZoomIn(); },
      QKeySequence::ZoomIn);
  addItem(
      viewMenu, QStringLiteral("Zoom Out"), [&commands] { commands.menuZoomOut(); },
      QKeySequence::ZoomOut);
  addItem(
      viewMenu, QStringLiteral("Frame Scene"), [&view] { view.frameScene(); },
      QKeySequence(QStringLiteral("Ctrl+F")));
  QAction* trackball = addItem(viewMenu, QStringLiteral("Show Trackball"),
                               [&view] { view.setShowTrackball(!view.showTrackball()); });
  trackball->setCheckable(true);
  QObject::connect(viewMenu, &QMenu::aboutToShow, viewMenu,
                   [trackball, &view] { trackball->setChecked(view.showTrackball()); });
  viewMenu->addSeparator();

  addItem(viewMenu, QStringLiteral("Bookmark Camera…"), [&window, &commands] {
    bool ok = false;
    const QString title =
        QInputDialog::getText(&window, QStringLiteral("Bookmark Camera"),
                              QStringLiteral("Bookmark title:"), QLineEdit::Normal, QString(), &ok);
    if (ok && !title.isEmpty()) {
      commands.menuBookmarkCamera(title.toStdString());
    }
  });
  QMenu* recall = viewMenu->addMenu(QStringLiteral("Recall Bookmark"));
  QObject::connect(recall, &QMenu::aboutToShow, recall, [recall, &window, &commands] {
    recall->clear();
    const auto& bookmarks = window.document()->viewBookmarks();
    if (!bookmarks || bookmarks->empty()) {
      recall->addAction(QStringLiteral("No Bookmarks"))->setEnabled(false);
      return;
    }
    for (const auto& [title, bookmark] : *bookmarks) {
      addItem(recall, QString::fromStdString(title),
              [&commands, title] { commands.menuRecallCamera(title); });
    }
  });
  addItem(viewMenu, QStringLiteral("Save Screenshot"), [&view] {
    Error error;
    if (!view.captureScreenShot(&error)) {
      UserInteraction::shared().presentError(error);
    }
  });
  viewMenu->addSeparator();
  addItem(viewMenu, QStringLiteral("New View"),
          [&application, &window] { application.openNewView(window); });
  addItem(
      viewMenu, QStringLiteral("Full Screen"),
      [&window, &view] {
        const bool full = !window.isFullScreen();
        full ? window.showFullScreen() : window.showNormal();
        view.setIsFullScreen(full);
      },
      QKeySequence::FullScreen);
}

void buildLayerMenu(QMenuBar* bar, DocumentWindow& window, Application& application) {
  QMenu* layer = bar->addMenu(QStringLiteral("&Layer"));
  ApplicationCommands& commands = application.commands();
  addItem(layer, QStringLiteral("Add Point"), [&commands] { commands.addPoint(); });
  addItem(layer, QStringLiteral("Add Primitive"), [&commands] { commands.addPrimitive(); });
  addItem(layer, QStringLiteral("Add Ocean"), [&commands] { commands.addOcean(); });
  addItem(layer, QStringLiteral("Add Picture Card…"), [&commands] { commands.import2DCard(); });
  addItem(layer, QStringLiteral("Add SLERP Camera Path"), [&commands] { commands.addSLERP(); });
  layer->addSeparator();
  addItem(
      layer, QStringLiteral("Previous Layer"), [&commands] { commands.menuLayerPrevious(); },
      QKeySequence(QStringLiteral("Ctrl+[")), menu_action::kLayerPrevious);
  addItem(
      layer, QStringLiteral("Next Layer"), [&commands] { commands.menuLayerNext(); },
      QKeySequence(QStringLiteral("Ctrl+]")), menu_action::kLayerNext);
  layer->addSeparator();
  addItem(
      layer, QStringLiteral("Re-randomize Buckets…"),
      [&application] {
        if (application.commands().menuReRandomizeBuckets()) {
          application.runReRandomizeSheet();
        }
      },
      {}, menu_action::kReRandomizeBuckets);
  addItem(
      layer, QStringLiteral("Re-save Layer"), [&commands] { commands.menuReSaveLayer(); }, {},
      menu_action::kReSaveLayer);
  addItem(layer, QStringLiteral("Bake Transformation"),
          [&commands] { commands.bakeTransformation(); });
  layer->addSeparator();
  PointsDocumentGLView& view = window.glView().pointView();
  QAction* play = addItem(layer, QStringLiteral("Play Camera Path"), [&window, &view] {
    view.beginAnimatingWithCameraPath(
        std::dynamic_pointer_cast<CameraPath>(window.document()->selectedLayer()));
  });
  QAction* stop =
      addItem(layer, QStringLiteral("Stop Playback"), [&view] { view.stopAnimating(); });
  QAction* renderPath = addItem(layer, QStringLiteral("Render Camera Path"),
                                [&application, &window] { application.renderCameraPath(window); });
  markValidated({play, stop, renderPath});
  QObject::connect(layer, &QMenu::aboutToShow, layer, [play, stop, renderPath, &window, &view] {
    const bool path =
        std::dynamic_pointer_cast<CameraPath>(window.document()->selectedLayer()) != nullptr;
    play->setEnabled(path);
    renderPath->setEnabled(path);
    stop->setEnabled(view.isAnimating());
  });
  validateOnShow(layer, application);
}

// The floating panels, one each for the whole application, showing the
// front document.
void buildWindowMenu(QMenuBar* bar, DocumentWindow& window, Application& application) {
  QMenu* windows = bar->addMenu(QStringLiteral("&Window"));
  addItem(
      windows, QStringLiteral("Minimize"), [&window] { window.showMinimized(); },
      QKeySequence(QStringLiteral("Ctrl+M")));
  windows->addSeparator();
  addItem(
      windows, QStringLiteral("Timeline"), [&application] { application.showTimeline(); },
      QKeySequence(QStringLiteral("Ctrl+T")));
  addItem(windows, QStringLiteral("Cameras"), [&application] { application.showCamerasPanel(); });
  addItem(windows, QStringLiteral("Camera Paths"),
          [&application] { application.showPathsPanel(); });
  addItem(windows, QStringLiteral("View Controls"),
          [&application] { application.showViewControls(); });
  addItem(windows, QStringLiteral("Photograph"),
          [&application] { application.showPhotographWindow(); });
  addItem(windows, QStringLiteral("Properties"),
          [&application] { application.showPropertyPanel(); });
  addItem(windows, QStringLiteral("Colour Grading"),
          [&application] { application.showColourGradingPanel(); });
}

}  // namespace

void buildDocumentMenus(DocumentWindow& window, Application& application) {
  QMenuBar* bar = window.menuBar();
  buildFileMenu(bar, window, application);
  buildEditMenu(bar, window);
  buildViewMenu(bar, window, application);
  buildLayerMenu(bar, window, application);
  buildWindowMenu(bar, window, application);
  // A menu disables what cannot be done while it is open; once closed its
  // items are enabled again, so that their shortcuts reach the commands,
  // which refuse what they cannot do.
  for (QMenu* menu : bar->findChildren<QMenu*>()) {
    QObject::connect(menu, &QMenu::aboutToHide, menu, [menu] {
      for (QAction* action : menu->actions()) {
        if (action->property(kValidatedProperty).toBool()) {
          action->setEnabled(true);
        }
      }
    });
  }
}

}  // namespace cloudreel::app
