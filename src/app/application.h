#pragma once
// The desktop application: its open documents and their windows, the
// front (main) document window, launch and quit, and the application-wide
// commands of the menus. The decisions live in the core (ApplicationCommands
// for the commands, DocumentSession for each document's file); this class
// makes and closes the Qt windows around them.

#include <QObject>
#include <QPointer>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "app/qt_platform.h"
#include "platform/run_loop.h"
#include "scene/application_commands.h"
#include "scene/document_session.h"

class QFileDialog;
class QProgressDialog;

namespace cloudreel::gl {
class ShareGroup;
}

namespace cloudreel::app {

class CamerasPanel;
class ColourGradingPanel;
class DocumentWindow;
class PathsPanel;
class PhotographWindow;
class PreferencesWindow;
class PropertyPanel;
class TimelineWindow;
class ViewControlsPanel;

class Application : public QObject {
  Q_OBJECT
 public:
  struct Options {
    std::vector<std::filesystem::path> files;
    // With a path: draw the first window once, save its picture there, quit.
    std::optional<std::filesystem::path> screenshot;
    int windowWidth = 1024;
    int windowHeight = 768;
  };

  explicit Application(Options options);
  ~Application() override;

  // Opens the files named at launch (or an untitled document when the
  // defaults ask for one) and shows their windows. Answers NO when a
  // screenshot was asked for and nothing could be opened.
  bool launch();
  // The status the application quits with (1 when a screenshot failed).
  int exitStatus() const { return exitStatus_; }

  ApplicationCommands& commands() { return commands_; }
  const std::shared_ptr<gl::ShareGroup>& shareGroup() const { return shareGroup_; }
  const std::vector<DocumentWindow*>& windows() const { return windows_; }
  DocumentWindow* mainWindow() const { return mainWindow_; }

  // --- documents
  DocumentWindow* newDocument();
  // A document file opens in a window (the window it already has, when it
  // is open); a point file is imported into a new document. Errors are
  // presented; answers the window or null.
  DocumentWindow* openFile(const std::filesystem::path& path);
  void openDocumentWithPanel();
  void openNewView(DocumentWindow& window);
  std::vector<std::filesystem::path> recentDocuments() const;
  void clearRecentDocuments();
  void noteRecentDocument(const std::filesystem::path& path);

  // --- windows call these
  void windowDidBecomeMain(DocumentWindow& window);
  // Answers whether the window may close: the last window of an edited
  // document asks first.
  bool windowShouldClose(DocumentWindow& window);
  void windowWillClose(DocumentWindow& window);

  // Asks for every edited document; quits unless the user cancels.
  void terminate();
  void showPreferences();
  // The floating panels, one each for the application, made when first
  // shown; each follows the front document (null until shown).
  void showTimeline();
  void showCamerasPanel();
  void showPathsPanel();
  void showViewControls();
  void showPhotographWindow();
  void showPropertyPanel();
  void showColourGradingPanel();
  TimelineWindow* timelineWindow() const { return timeline_.get(); }
  CamerasPanel* camerasPanel() const { return camerasPanel_.get(); }
  PathsPanel* pathsPanel() const { return pathsPanel_.get(); }
  ViewControlsPanel* viewControls() const { return viewControls_.get(); }
  PhotographWindow* photographWindow() const { return photographWindow_.get(); }
  PropertyPanel* propertyPanel() const { return propertyPanel_.get(); }
  ColourGradingPanel* colourGradingPanel() const { return colourGradingPanel_.get(); }
  // The sheets some commands ask for (see ApplicationCommands).
  void runPLYOptionsSheet();
  void runReRandomizeSheet();
  // Renders the window's selected camera path into the image folder of the
  // defaults (the Layer menu and the view controls offer it), with a wait
  // cursor meanwhile, then tells the user how many frames went where. A
  // selection that is no camera path beeps.
  void renderCameraPath(DocumentWindow& window);
  // Gives the import commands' open panels their options (the other panels
  // stay as they are); QtUserInteraction calls it for every open panel.
  void customizeOpenPanel(QFileDialog& dialog);
  // The dialog that says which files are being read, while any are (it
  // shows itself once reading has taken half a second); null otherwise.
  QProgressDialog* importProgress() const;

 signals:
  void recentDocumentsChanged();

 private:
  DocumentWindow* makeWindow(std::shared_ptr<DocumentSession> session);
  void giveContext(DocumentSession& session);
  void takeScreenshot(DocumentWindow& window);
  void importsChanged();
  int nextUntitledNumber();

  Options options_;
  RunLoopBridge bridge_;
  ApplicationCommands commands_;
  BackgroundQueue importQueue_;
  std::shared_ptr<gl::ShareGroup> shareGroup_;
  std::vector<DocumentWindow*> windows_;
  DocumentWindow* mainWindow_ = nullptr;
  std::unique_ptr<PreferencesWindow> preferences_;
  std::unique_ptr<TimelineWindow> timeline_;
  std::unique_ptr<CamerasPanel> camerasPanel_;
  std::unique_ptr<PathsPanel> pathsPanel_;
  std::unique_ptr<ViewControlsPanel> viewControls_;
  std::unique_ptr<PhotographWindow> photographWindow_;
  std::unique_ptr<PropertyPanel> propertyPanel_;
  std::unique_ptr<ColourGradingPanel> colourGradingPanel_;
  QPointer<QProgressDialog> importProgress_;
  int untitledCount_ = 0;
  int exitStatus_ = 0;
  bool terminating_ = false;
};

}  // namespace cloudreel::app
