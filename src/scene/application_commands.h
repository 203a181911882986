#pragma once
// The application's commands without a toolkit: which document is in front,
// the import, add, layer and view commands that act on it, whether a menu
// item is enabled, and the preferences window's model. The Qt shell shows
// the panels, sheets and wells and forwards the user's choices here; what
// the user is asked (open panels, alerts) goes through UserInteraction.

#include <array>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/color.h"
#include "platform/error.h"
#include "platform/object.h"
#include "scene/my_document.h"

namespace cloudreel {

class BackgroundQueue;
class Layer;
class PointLayer;
class RunLoop;
class UserDefaults;

// --- point files by extension

enum class PointFileKind { Unknown, PointFile, Ply, Bundler };

// The kind of file an extension (without its dot) names, compared exactly:
// "rwb", "ply" and "out" (a bundle file). "PLY" is Unknown: the application
// refuses it; the command line lowers the case first.
PointFileKind pointFileKindForExtension(std::string_view extension);
// The same for a path's extension; a path without one is Unknown.
PointFileKind pointFileKindForPath(const std::filesystem::path& path);

// The options view an open panel shows beside the selected file.
enum class ImportOptionsView { None, PointFile, Bundler, Ply, Card };
// For the point-file import: follows the selected file's extension.
ImportOptionsView importOptionsViewForFile(const std::filesystem::path& selected);

inline constexpr std::string_view kUnknownFileFormatMessage = "Unknown file format";
inline constexpr std::string_view kUnknownFileFormatInformative =
    "Cannot determine file type, or unsupported";

// The option views' controls, kept in the user defaults under these keys so
// they read as the user left them. Unset keys read as off and 0 (a factor
// below 1 keeps every vertex).
inline constexpr std::string_view kOpenPointFileAsReferenceKey = "openPointFileAsReference";
inline constexpr std::string_view kOpenRWBFileAsReferenceKey = "openRWBFileAsReference";
inline constexpr std::string_view kOpenPLYFileAsReferenceKey = "openPLYFileAsReference";
inline constexpr std::string_view kOpenPLYDownsampleKey = "openPLYDownsample";
inline constexpr std::string_view kOpenPLYDownsampleFactorKey = "openPLYDownsampleFactor";
// The card import shows the whole numbered sequence of the chosen picture.
inline constexpr std::string_view kOpenCardAsSequenceKey = "openCardAsSequence";

// What a card shows for a chosen picture: the picture itself, or, as a
// sequence, a pattern with the last run of digits in the file's name
// replaced by a conversion of that width (shot_0042.png gives
// shot_%04d.png). A name without digits is a picture either way.
std::string cardSourceForFile(const std::filesystem::path& file, bool asSequence);

struct ImportOptions {
  bool openPointFileAsReference = false;
  bool openRWBFileAsReference = false;
  // Shown in the PLY view but read by nothing: a PLY layer always keeps its
  // points in the document.
  bool openPLYFileAsReference = false;
  bool openPLYDownsample = false;
  // Saturated into 32 bits when read from the defaults.
  std::int32_t openPLYDownsampleFactor = 1;

  static ImportOptions fromDefaults(const UserDefaults& defaults);
  void saveToDefaults(UserDefaults& defaults) const;
};

// What an import reads: the kind of layer, the file and how.
struct ImportRequest {
  enum class Kind { PointFile, Bundler, Ply, ZXYCameraPath, MatrixCameraPath };
  Kind kind = Kind::PointFile;
  std::filesystem::path url;
  bool shouldLink = false;
  std::int32_t downsample = 1;
  // A bundle file's cameras (its first child) also join the document's
  // stored camera paths: importBundler asks for it, importPointFile not.
  bool storeCameras = false;
};

// The request the point-file import makes for a file, by its extension and
// the import options; nothing for an extension it does not know.
std::optional<ImportRequest> importRequestForFile(const std::filesystem::path& url,
                                                  const ImportOptions& options);

// What reading gave: the layer (null on failure), the camera path that also
// joins the document's stored paths (a camera path file's, or a bundle
// file's cameras when asked for), and the error to present (empty when
// there is none to show: a PLY file's reader gives its reasons in the log).
struct ImportResult {
  std::shared_ptr<Layer> layer;
  std::shared_ptr<CameraPath> cameraPath;
  Error error;
};

// Reads the file of a request without asking the user anything, so it may
// run on any thread: a point file that is not where the panel found it is
// an error here rather than a search of the point cache.
ImportResult readImport(const ImportRequest& request);

// The window controller of a document window, as the commands see it.
// Activation notifications are posted with it as their object.
class DocumentWindowController {
 public:
  virtual ~DocumentWindowController() = default;
  virtual std::shared_ptr<MyDocument> document() const = 0;
  virtual void zoomIn() = 0;
  virtual void zoomOut() = 0;
};

inline constexpr std::string_view kDocumentActivateNotification =
    "KTPointDocument_DocumentActivateNotification";
inline constexpr std::string_view kDocumentDeactivateNotification =
    "KTPointDocument_DocumentDeactivateNotification";

// The menu commands' action names, as validateMenuItem takes them.
namespace menu_action {
inline constexpr std::string_view kReRandomizeBuckets = "menuReRandomizeBuckets:";
inline constexpr std::string_view kLayerNext = "menuLayerNext:";
inline constexpr std::string_view kLayerPrevious = "menuLayerPrevious:";
inline constexpr std::string_view kReSaveLayer = "menuReSaveLayer:";
}  // namespace menu_action

class ApplicationCommands : public Object, public ApplicationDelegate, public Observer {
 public:
  // Registers the application defaults in the standard user defaults
  // (harmless when already registered).
  ApplicationCommands();
  // Stops receiving notifications and stops being the shared delegate if it
  // is.
  ~ApplicationCommands() override;

  std::string_view className() const override { return "AppDelegate"; }
  const PropertyTable& properties() const override;

  // --- application life
  // Becomes the shared delegate, follows the document windows' activation
  // notifications and takes `current` (may be null) as the front window.
  void applicationDidFinishLaunching(DocumentWindowController* current);
  bool applicationShouldTerminateAfterLastWindowClosed() const;
  bool applicationShouldOpenUntitledFile() const;

  // --- the front document. The controller is not owned: the shell posts
  // the deactivation before a window goes. The document is held weakly.
  void documentWindowDidActivate(DocumentWindowController* controller);
  void documentWindowDidDeactivate();
  std::shared_ptr<MyDocument> theDocument() const { return theDocument_.lock(); }
  DocumentWindowController* theWindow() const { return theWindow_; }
  bool currentDocumentIsValid() const { return theDocument() != nullptr; }

  // --- the current layer (set by the document) and its visibility
  void setCurrentLayer(const std::shared_ptr<Layer>& layer) override;
  std::shared_ptr<Layer> currentLayer() const { return currentLayer_.lock(); }
  // Reads and sets the document's selected layer's visibility; off without
  // one. Setting also redraws the document.
  bool currentLayerVisible() const;
  void setCurrentLayerVisible(bool visible);

  // --- imports. Each runs one open panel; a cancel does nothing. The layer
  // is added with the document's addLayer ("New Layer", selected). With no
  // front document nothing is asked or added.
  void importPointFile();
  // A point file, linked by the point-file (not the rwb) check box.
  void importRWB();
  // Answers whether the PLY options sheet must be shown now: a file was
  // chosen, and endPLYOptionsSheet finishes the import whichever button
  // ended the sheet.
  bool importPLY();
  void endPLYOptionsSheet();
  std::int32_t plyDownsample() const { return plyDownsample_; }
  void setPLYDownsample(std::int32_t v) { plyDownsample_ = v; }
  bool plyShallDownsample() const { return plyShallDownsample_; }
  void setPLYShallDownsample(bool v) { plyShallDownsample_ = v; }
  void importCameraPath();
  void importMatrixPath();
  void importBundler();
  // Whether one of the import commands' open panels is running now.
  bool importPanelRunning() const { return importPanelRunning_; }
  // The options view that panel shows while `selected` is the file selected
  // in it (empty when none is): the point-file import's follows
  // importOptionsViewForFile, every other import's is fixed. None while no
  // import panel runs.
  ImportOptionsView openPanelOptionsView(const std::filesystem::path& selected = {}) const;

  // Reads a file into the front document as the import commands do once
  // their panel has answered (the application's own launch arguments come
  // here too).
  void runImport(ImportRequest request);

  // Reading a file off the main thread: with a queue set, reads run on it
  // and the layer is added by a task on `completionLoop`, to the document
  // that was in front when the command ran (nothing when it has gone).
  // Without one (the default) reading happens inside the command. Neither
  // is owned; both must outlive the commands' use of them.
  void setBackgroundReading(BackgroundQueue* queue, RunLoop* completionLoop);
  // Reads started and not yet finished on the completion loop, and their
  // files in the order they started.
  int importsInProgress() const { return static_cast<int>(filesBeingRead_.size()); }
  const std::vector<std::filesystem::path>& filesBeingRead() const { return filesBeingRead_; }
  // Called on the command's thread when a background read starts and on the
  // completion loop when one ends (after its layer was added, or its error
  // presented): what a progress display follows.
  void setImportsChangedHandler(std::function<void()> handler) {
    importsChanged_ = std::move(handler);
  }

  // --- add commands: a new object through addLayer
  void addPoint();
  void addPrimitive();
  // An ocean, with a "Time" track so that its waves move as the timeline
  // plays: one undo step, "Add Ocean".
  void addOcean();
  // A card showing the picture (or its numbered sequence, as the panel's
  // option says) that an open panel chooses; a cancel adds nothing.
  void import2DCard();
  // Also joins the document's stored camera paths.
  void addSLERP();

  // --- layer commands
  void menuLayerPrevious();
  void menuLayerNext();
  // Answers whether the re-randomise sheet must be shown: the selected
  // layer is a point layer, kept for endReRandomizeOptionsSheet, which with
  // return code 0 re-randomises it with the exponent and redraws; any other
  // code does nothing.
  bool menuReRandomizeBuckets();
  void endReRandomizeOptionsSheet(int returnCode, float exponent);
  // Writes the selected layer back to its file when its class is exactly
  // PointLayer.
  void menuReSaveLayer();
  // The "Warning" alert with "Bake" and "Cancel"; neither changes anything.
  void bakeTransformation();

  // --- view commands
  // A copy of the scene camera under the title, replacing an earlier one.
  void menuBookmarkCamera(const std::string& title);
  // The stored camera itself becomes the scene camera, so navigating moves
  // the bookmark too until it is taken again; redraws in any case.
  void menuRecallCamera(const std::string& title);
  void menuZoomIn();
  void menuZoomOut();

  // --- menu validation by action name; unknown actions are enabled
  bool validateMenuItem(std::string_view action) const;

 private:
  void handleActivation(const Notification& notification);
  void finishImport(const std::weak_ptr<MyDocument>& target, ImportResult result);
  // `followsSelection`: the panel's options view follows the selected file.
  std::optional<std::filesystem::path> chooseFile(ImportOptionsView view,
                                                  bool followsSelection = false);
  void addNewLayer(std::shared_ptr<Layer> layer, std::shared_ptr<CameraPath> cameraPath);
  // The selected layer's index in the document's top-level layers.
  std::optional<std::size_t> selectedIndex() const;

  std::weak_ptr<MyDocument> theDocument_;
  DocumentWindowController* theWindow_ = nullptr;
  std::weak_ptr<Layer> currentLayer_;
  std::int32_t plyDownsample_ = 1;
  bool plyShallDownsample_ = false;
  std::optional<std::filesystem::path> pendingPLY_;
  std::weak_ptr<PointLayer> reRandomizeTarget_;
  ImportOptionsView openPanelOptionsView_ = ImportOptionsView::None;
  bool importPanelRunning_ = false;
  bool openPanelFollowsSelection_ = false;
  BackgroundQueue* queue_ = nullptr;
  RunLoop* completionLoop_ = nullptr;
  std::vector<std::filesystem::path> filesBeingRead_;
  std::function<void()> importsChanged_;
  bool observing_ = false;
};

// The preferences window's model: five colour wells and two folders.
class PreferenceController {
 public:
  enum class Well { Grid, Point, Background, Frustum, SelectedFrustum };
  static constexpr std::array<Well, 5> kWells = {Well::Grid, Well::Point, Well::Background,
                                                 Well::Frustum, Well::SelectedFrustum};
  static std::string_view keyForWell(Well well);

  // The colour archived under a key; null when it holds none.
  static std::shared_ptr<Color> prefsColorNamed(std::string_view key);
  // What the wells show when the window loads, in kWells order.
  std::array<std::shared_ptr<Color>, 5> wellColors() const;
  // Archives the colour into the well's key; every well but the point
  // colour's then posts "KTGridColorChanged" with this controller as
  // object (point colour applies only to layers made afterwards).
  void changePrefsColorFromColorWell(const Color& color, Well well);
  // A folder-only open panel; the chosen folder's path becomes
  // "KTImageSavePath" / "KTPointCachePath". A cancel changes nothing.
  void changeImagePath();
  void changePointProxyPath();
};

}  // namespace cloudreel
