#include "scene/application_commands.h"

#include <algorithm>
#include <limits>
#include <typeinfo>
#include <utility>

#include "camera/discrete_camera_path.h"
#include "camera/scene_camera.h"
#include "camera/slerp_camera_path.h"
#include "camera/zxy_camera_path.h"
#include "import/bundler_file.h"
#include "import/ply_file.h"
#include "platform/application_defaults.h"
#include "platform/file_location.h"
#include "platform/log.h"
#include "platform/notification_center.h"
#include "platform/run_loop.h"
#include "platform/undo_manager.h"
#include "platform/user_defaults.h"
#include "platform/user_interaction.h"
#include "scene/animated_card.h"
#include "scene/layer.h"
#include "scene/ocean_fft.h"
#include "scene/point_3d.h"
#include "scene/point_layer.h"
#include "scene/sphere.h"
#include "timeline/timeline_editing.h"
#include "timeline/timeline_track.h"

namespace cloudreel {

namespace {

// Only a plain point layer re-saves its linked file; its subclasses (a
// reconstruction's cloud) are read from files of their own.
bool isPlainPointLayer(const Layer* layer) {
  return layer != nullptr && typeid(*layer) == typeid(PointLayer);
}

std::string extensionWithoutDot(const std::filesystem::path& path) {
  std::string extension = path.extension().string();
  if (!extension.empty() && extension.front() == '.') {
    extension.erase(0, 1);
  }
  return extension;
}

// The point layer's own errors say what failed but not on which file.
void nameTheFile(Error& error, const std::filesystem::path& url) {
  const std::string file = url.string();
  if (error.message.find(file) == std::string::npos) {
    error.message += ": " + file;
  }
}

// Loads a point layer of either file kind made blank, as the layer's own
// URL initialiser does, but with the failure kept as a value.
void loadInto(const std::shared_ptr<PointLayer>& layer, const ImportRequest& request,
              ImportResult& result) {
  layer->setOriginalURL(request.url);
  layer->setFileStoredAsLink(request.shouldLink);
  layer->setName(lastPathComponent(request.url));
  Error error;
  // The result is inverted and a short read still answers success: only
  // the error tells.
  (void)layer->loadPointsFromURLError(request.url, &error);
  if (!error.message.empty()) {
    nameTheFile(error, request.url);
    result.error = std::move(error);
    return;
  }
  result.layer = layer;
}

}  // namespace

PointFileKind pointFileKindForExtension(std::string_view extension) {
  if (extension == "rwb") {
    return PointFileKind::PointFile;
  }
  if (extension == "ply") {
    return PointFileKind::Ply;
  }
  if (extension == "out") {
    return PointFileKind::Bundler;
  }
  return PointFileKind::Unknown;
}

PointFileKind pointFileKindForPath(const std::filesystem::path& path) {
  return pointFileKindForExtension(extensionWithoutDot(path));
}

ImportOptionsView importOptionsViewForFile(const std::filesystem::path& selected) {
  switch (pointFileKindForPath(selected)) {
    case PointFileKind::PointFile:
      return ImportOptionsView::PointFile;
    case PointFileKind::Bundler:
      return ImportOptionsView::Bundler;
    case PointFileKind::Ply:
      return ImportOptionsView::Ply;
    case PointFileKind::Unknown:
      break;
  }
  return ImportOptionsView::None;
}

ImportOptions ImportOptions::fromDefaults(const UserDefaults& defaults) {
  ImportOptions options;
  options.openPointFileAsReference = defaults.boolForKey(kOpenPointFileAsReferenceKey);
  options.openRWBFileAsReference = defaults.boolForKey(kOpenRWBFileAsReferenceKey);
  options.openPLYFileAsReference = defaults.boolForKey(kOpenPLYFileAsReferenceKey);
  options.openPLYDownsample = defaults.boolForKey(kOpenPLYDownsampleKey);
  constexpr std::int64_t lowest = std::numeric_limits<std::int32_t>::min();
  constexpr std::int64_t highest = std::numeric_limits<std::int32_t>::max();
  options.openPLYDownsampleFactor = static_cast<std::int32_t>(
      std::clamp(defaults.integerForKey(kOpenPLYDownsampleFactorKey), lowest, highest));
  return options;
}

void ImportOptions::saveToDefaults(UserDefaults& defaults) const {
  defaults.setObjectForKey(openPointFileAsReference, kOpenPointFileAsReferenceKey);
  defaults.setObjectForKey(openRWBFileAsReference, kOpenRWBFileAsReferenceKey);
  defaults.setObjectForKey(openPLYFileAsReference, kOpenPLYFileAsReferenceKey);
  defaults.setObjectForKey(openPLYDownsample, kOpenPLYDownsampleKey);
  defaults.setObjectForKey(std::int64_t{openPLYDownsampleFactor}, kOpenPLYDownsampleFactorKey);
}

ImportResult readImport(const ImportRequest& request) {
  ImportResult result;
  switch (request.kind) {
    case ImportRequest::Kind::PointFile: {
      // The layer would look in the point cache and then ask the user to
      // locate a missing file; off the main thread nobody can be asked.
      std::error_code ec;
      if (!std::filesystem::is_regular_file(request.url, ec)) {
        setError(&result.error, std::string(kPointFileErrorDomain), kPointFileErrorCode,
                 "Cannot open file: " + request.url.string());
        break;
      }
      loadInto(std::make_shared<PointLayer>(), request, result);
      break;
    }
    case ImportRequest::Kind::Bundler: {
      auto layer = std::make_shared<BundlerFile>();
      loadInto(layer, request, result);
      if (request.storeCameras && result.layer && !layer->childLayers().empty()) {
        // The reconstruction's cameras, as a camera field.
        result.cameraPath = std::dynamic_pointer_cast<CameraPath>(layer->childLayers().front());
      }
      break;
    }
    case ImportRequest::Kind::Ply:
      result.layer = PLYFile::initWithURLDownsample(request.url, request.downsample);
      if (!result.layer) {
        // The PLY reader has printed its reason; the user is told nothing
        // more, as the import has always done.
        logWarningf("Cannot read points from %s", request.url.c_str());
      }
      break;
    case ImportRequest::Kind::ZXYCameraPath: {
      auto path = ZXYCameraPath::initWithURL(request.url);
      result.layer = path;
      result.cameraPath = path;
      break;
    }
    case ImportRequest::Kind::MatrixCameraPath: {
      auto path = DiscreteCameraPath::initWithURL(request.url);
      result.layer = path;
      result.cameraPath = path;
      break;
    }
  }
  return result;
}

// --- ApplicationCommands

ApplicationCommands::ApplicationCommands() {
  registerApplicationDefaults(UserDefaults::standardUserDefaults());
}

ApplicationCommands::~ApplicationCommands() {
  if (observing_) {
    NotificationCenter::defaultCenter().removeObserver(*this);
  }
  if (ApplicationDelegate::shared() == this) {
    ApplicationDelegate::setShared(nullptr);
  }
}

const PropertyTable& ApplicationCommands::properties() const {
  static const PropertyTable table(
      &Object::properties(),
      {property<ApplicationCommands>("currentLayerVisible",
                                     &ApplicationCommands::currentLayerVisible,
                                     &ApplicationCommands::setCurrentLayerVisible),
       readOnlyProperty<ApplicationCommands>("currentDocumentIsValid",
                                             &ApplicationCommands::currentDocumentIsValid)});
  return table;
}

void ApplicationCommands::applicationDidFinishLaunching(DocumentWindowController* current) {
  ApplicationDelegate::setShared(this);
  if (!observing_) {
    NotificationCenter& center = NotificationCenter::defaultCenter();
    center.addObserver(*this, std::string(kDocumentActivateNotification), nullptr,
                       [this](const Notification& n) { handleActivation(n); });
    center.addObserver(*this, std::string(kDocumentDeactivateNotification), nullptr,
                       [this](const Notification&) { documentWindowDidDeactivate(); });
    observing_ = true;
  }
  documentWindowDidActivate(current);
}

bool ApplicationCommands::applicationShouldTerminateAfterLastWindowClosed() const {
  return UserDefaults::standardUserDefaults().boolForKey(kTerminateAfterLastWindowClosedKey);
}

bool ApplicationCommands::applicationShouldOpenUntitledFile() const {
  return UserDefaults::standardUserDefaults().boolForKey(kEmptyDocKey);
}

void ApplicationCommands::handleActivation(const Notification& notification) {
  // The document windows post their controller as the object; the
  // controller is not const to us, only to the notification centre.
  auto* controller = const_cast<DocumentWindowController*>(
      static_cast<const DocumentWindowController*>(notification.object));
  if (controller == nullptr) {
    logf("document activation without a window controller ignored");
    return;
  }
  documentWindowDidActivate(controller);
}

void ApplicationCommands::documentWindowDidActivate(DocumentWindowController* controller) {
  willChangeValueForKey("currentDocumentIsValid");
  theWindow_ = controller;
  theDocument_ = controller != nullptr ? controller->document() : nullptr;
  didChangeValueForKey("currentDocumentIsValid");
}

void ApplicationCommands::documentWindowDidDeactivate() {
  willChangeValueForKey("currentDocumentIsValid");
  theWindow_ = nullptr;
  theDocument_.reset();
  didChangeValueForKey("currentDocumentIsValid");
}

void ApplicationCommands::setCurrentLayer(const std::shared_ptr<Layer>& layer) {
  willChangeValueForKey("currentLayerVisible");
  willChangeValueForKey("currentLayer");
  currentLayer_ = layer;
  didChangeValueForKey("currentLayer");
  didChangeValueForKey("currentLayerVisible");
}

bool ApplicationCommands::currentLayerVisible() const {
  const auto document = theDocument();
  const auto layer = document ? document->selectedLayer() : nullptr;
  return layer && layer->isVisible();
}

void ApplicationCommands::setCurrentLayerVisible(bool visible) {
  const auto document = theDocument();
  const auto layer = document ? document->selectedLayer() : nullptr;
  if (!layer) {
    return;
  }
  layer->setIsVisible(visible);
  document->hasChanged();
}

// --- imports

std::optional<std::filesystem::path> ApplicationCommands::chooseFile(ImportOptionsView view,
                                                                     bool followsSelection) {
  openPanelOptionsView_ = view;
  openPanelFollowsSelection_ = followsSelection;
  importPanelRunning_ = true;
  const std::optional<std::string> chosen =
      UserInteraction::shared().runOpenPanel(OpenPanel{"Import", true, false, {}});
  importPanelRunning_ = false;
  openPanelFollowsSelection_ = false;
  openPanelOptionsView_ = ImportOptionsView::None;
  if (!chosen) {
    return std::nullopt;
  }
  return std::filesystem::path(*chosen);
}

ImportOptionsView ApplicationCommands::openPanelOptionsView(
    const std::filesystem::path& selected) const {
  if (openPanelFollowsSelection_) {
    return importOptionsViewForFile(selected);
  }
  return openPanelOptionsView_;
}

std::optional<ImportRequest> importRequestForFile(const std::filesystem::path& url,
                                                  const ImportOptions& options) {
  ImportRequest request{ImportRequest::Kind::PointFile, url, false, 1};
  switch (pointFileKindForPath(url)) {
    case PointFileKind::PointFile:
      request.shouldLink = options.openRWBFileAsReference;
      break;
    case PointFileKind::Bundler:
      request.kind = ImportRequest::Kind::Bundler;
      request.shouldLink = options.openPointFileAsReference;
      break;
    case PointFileKind::Ply:
      request.kind = ImportRequest::Kind::Ply;
      request.downsample = options.openPLYDownsample ? options.openPLYDownsampleFactor : 1;
      break;
    case PointFileKind::Unknown:
      return std::nullopt;
  }
  return request;
}

void ApplicationCommands::importPointFile() {
  if (!theDocument()) {
    return;
  }
  const auto url = chooseFile(ImportOptionsView::None, true);
  if (!url) {
    return;
  }
  std::optional<ImportRequest> request =
      importRequestForFile(*url, ImportOptions::fromDefaults(UserDefaults::standardUserDefaults()));
  if (!request) {
    UserInteraction::shared().runAlert(Alert{std::string(kUnknownFileFormatMessage),
                                             std::string(kUnknownFileFormatInformative),
                                             {"OK"}});
    return;
  }
  runImport(std::move(*request));
}

void ApplicationCommands::importRWB() {
  if (!theDocument()) {
    return;
  }
  if (const auto url = chooseFile(ImportOptionsView::Bundler)) {
    const ImportOptions options = ImportOptions::fromDefaults(UserDefaults::standardUserDefaults());
    runImport({ImportRequest::Kind::PointFile, *url, options.openPointFileAsReference, 1});
  }
}

bool ApplicationCommands::importPLY() {
  if (!theDocument()) {
    return false;
  }
  pendingPLY_ = chooseFile(ImportOptionsView::None);
  return pendingPLY_.has_value();
}

void ApplicationCommands::endPLYOptionsSheet() {
  if (!pendingPLY_) {
    return;
  }
  ImportRequest request{ImportRequest::Kind::Ply, std::move(*pendingPLY_), false,
                        plyShallDownsample_ ? plyDownsample_ : 1};
  pendingPLY_.reset();
  runImport(std::move(request));
}

void ApplicationCommands::importCameraPath() {
  if (!theDocument()) {
    return;
  }
  if (const auto url = chooseFile(ImportOptionsView::None)) {
    runImport({ImportRequest::Kind::ZXYCameraPath, *url, false, 1});
  }
}

void ApplicationCommands::importMatrixPath() {
  if (!theDocument()) {
    return;
  }
  if (const auto url = chooseFile(ImportOptionsView::None)) {
    runImport({ImportRequest::Kind::MatrixCameraPath, *url, false, 1});
  }
}

void ApplicationCommands::importBundler() {
  if (!theDocument()) {
    return;
  }
  // The Bundler options are attached only after this panel has closed, so
  // the panel shows none.
  if (const auto url = chooseFile(ImportOptionsView::None)) {
    const ImportOptions options = ImportOptions::fromDefaults(UserDefaults::standardUserDefaults());
    runImport({ImportRequest::Kind::Bundler, *url, options.openPointFileAsReference, 1, true});
  }
}

void ApplicationCommands::setBackgroundReading(BackgroundQueue* queue, RunLoop* completionLoop) {
  const bool both = queue != nullptr && completionLoop != nullptr;
  queue_ = both ? queue : nullptr;
  completionLoop_ = both ? completionLoop : nullptr;
}

void ApplicationCommands::runImport(ImportRequest request) {
  std::weak_ptr<MyDocument> target = theDocument_;
  if (queue_ == nullptr) {
    finishImport(target, readImport(request));
    return;
  }
  filesBeingRead_.push_back(request.url);
  const std::filesystem::path url = request.url;
  auto result = std::make_shared<ImportResult>();
  // The completion runs on the loop these commands live on; the token
  // tells it whether they still do.
  std::weak_ptr<const void> alive = lifetimeToken();
  queue_->async(
      [result, request = std::move(request)] { *result = readImport(request); }, *completionLoop_,
      [this, alive, target = std::move(target), result, url] {
        if (alive.expired()) {
          return;
        }
        finishImport(target, std::move(*result));
        // The first entry for the file: reads of one file are
        // interchangeable to whoever lists them.
        if (const auto it = std::find(filesBeingRead_.begin(), filesBeingRead_.end(), url);
            it != filesBeingRead_.end()) {
          filesBeingRead_.erase(it);
        }
        if (importsChanged_) {
          importsChanged_();
        }
      });
  if (importsChanged_) {
    importsChanged_();
  }
}

void ApplicationCommands::finishImport(const std::weak_ptr<MyDocument>& target,
                                       ImportResult result) {
  if (!result.error.message.empty()) {
    UserInteraction::shared().presentError(result.error);
  }
  if (const auto document = target.lock(); document && result.layer) {
    document->addLayer(result.layer);
    if (result.cameraPath) {
      document->addCameraPath(result.cameraPath);
    }
  }
}

// --- add commands

void ApplicationCommands::addNewLayer(std::shared_ptr<Layer> layer,
                                      std::shared_ptr<CameraPath> cameraPath) {
  const auto document = theDocument();
  if (!document) {
    return;
  }
  document->addLayer(std::move(layer));
  if (cameraPath) {
    document->addCameraPath(std::move(cameraPath));
  }
}

void ApplicationCommands::addPoint() { addNewLayer(std::make_shared<Point3D>(), nullptr); }

void ApplicationCommands::addPrimitive() { addNewLayer(std::make_shared<Sphere>(), nullptr); }

void ApplicationCommands::addOcean() {
  const auto document = theDocument();
  if (!document) {
    return;
  }
  auto ocean = std::make_shared<OceanFFT>();
  UndoManager& undo = document->undoManager();
  undo.beginUndoGrouping();
  addNewLayer(ocean, nullptr);
  // An ocean that stood still until the user found its Time track would
  // look broken: it follows the timeline from the start.
  addTrackToDocument(*document, std::make_shared<TimelineTrack>(ocean, "frame", "Time"));
  undo.setActionName("Add Ocean");
  undo.endUndoGrouping();
}

std::string cardSourceForFile(const std::filesystem::path& file, bool asSequence) {
  const std::string name = file.filename().string();
  const std::size_t end = name.find_last_of("0123456789");
  if (!asSequence || end == std::string::npos) {
    return file.string();
  }
  std::size_t begin = end;
  while (begin > 0 && name[begin - 1] >= '0' && name[begin - 1] <= '9') {
    --begin;
  }
  std::string pattern;
  // A '%' of the name itself must stay a literal one in the pattern.
  for (std::size_t i = 0; i < begin; ++i) {
    pattern += name[i] == '%' ? std::string("%%") : std::string(1, name[i]);
  }
  const std::size_t width = end - begin + 1;
  pattern += width > 1 ? "%0" + std::to_string(width) + "d" : std::string("%d");
  for (std::size_t i = end + 1; i < name.size(); ++i) {
    pattern += name[i] == '%' ? std::string("%%") : std::string(1, name[i]);
  }
  return (file.parent_path() / pattern).string();
}

void ApplicationCommands::import2DCard() {
  if (!theDocument()) {
    return;
  }
  if (const auto url = chooseFile(ImportOptionsView::Card)) {
    const bool sequence = UserDefaults::standardUserDefaults().boolForKey(kOpenCardAsSequenceKey);
    auto card = std::make_shared<AnimatedCard>();
    card->setImagePath(cardSourceForFile(absolutePath(*url), sequence));
    if (!card->sourceError().empty()) {
      UserInteraction::shared().presentError(
          Error{std::string(kApplicationErrorDomain), 1, card->sourceError()});
      return;
    }
    card->setName(url->stem().string());
    addNewLayer(card, nullptr);
  }
}

void ApplicationCommands::addSLERP() {
  auto path = std::make_shared<SLERPCameraPath>();
  addNewLayer(path, path);
}

// --- layer commands

std::optional<std::size_t> ApplicationCommands::selectedIndex() const {
  const auto document = theDocument();
  const auto selected = document ? document->selectedLayer() : nullptr;
  if (!selected) {
    return std::nullopt;
  }
  const auto& layers = document->layers();
  const auto found = std::find(layers.begin(), layers.end(), selected);
  if (found == layers.end()) {
    return std::nullopt;
  }
  return static_cast<std::size_t>(found - layers.begin());
}

void ApplicationCommands::menuLayerPrevious() {
  const auto index = selectedIndex();
  if (index && *index > 0) {
    const auto document = theDocument();
    document->setSelectedLayer(document->layers()[*index - 1]);
  }
}

void ApplicationCommands::menuLayerNext() {
  const auto index = selectedIndex();
  const auto document = theDocument();
  if (index && *index + 1 < document->layers().size()) {
    document->setSelectedLayer(document->layers()[*index + 1]);
  }
}

bool ApplicationCommands::menuReRandomizeBuckets() {
  const auto document = theDocument();
  auto layer =
      std::dynamic_pointer_cast<PointLayer>(document ? document->selectedLayer() : nullptr);
  reRandomizeTarget_ = layer;
  return layer != nullptr;
}

void ApplicationCommands::endReRandomizeOptionsSheet(int returnCode, float exponent) {
  const auto layer = reRandomizeTarget_.lock();
  reRandomizeTarget_.reset();
  if (returnCode != 0 || !layer) {
    return;
  }
  layer->reRandomizeWithExponent(exponent);
  layer->invalidateOpenGLDisplayLists();
  if (const auto document = theDocument()) {
    document->hasChanged();
  }
}

void ApplicationCommands::menuReSaveLayer() {
  const auto document = theDocument();
  const auto layer = document ? document->selectedLayer() : nullptr;
  if (isPlainPointLayer(layer.get())) {
    static_cast<PointLayer&>(*layer).saveLinkedLayer();
  }
}

void ApplicationCommands::bakeTransformation() {
  if (!theDocument()) {
    return;
  }
  // A placeholder for folding the placement into the points: the answer is
  // not acted on, whichever button is pressed.
  (void)UserInteraction::shared().runAlert(Alert{"Warning", "", {"Bake", "Cancel"}});
}

// --- view commands

void ApplicationCommands::menuBookmarkCamera(const std::string& title) {
  const auto document = theDocument();
  if (!document || !document->sceneCamera()) {
    return;
  }
  MyDocument::Bookmarks bookmarks = document->viewBookmarks().value_or(MyDocument::Bookmarks{});
  bookmarks[title] = copyOf(*document->sceneCamera());
  document->setViewBookmarks(std::move(bookmarks));
}

void ApplicationCommands::menuRecallCamera(const std::string& title) {
  const auto document = theDocument();
  if (!document) {
    return;
  }
  if (const auto& bookmarks = document->viewBookmarks()) {
    const auto found = bookmarks->find(title);
    if (found != bookmarks->end() && found->second) {
      document->setSceneCamera(found->second);
    }
  }
  document->hasChanged();
}

void ApplicationCommands::menuZoomIn() {
  if (theWindow_ != nullptr && theDocument()) {
    theWindow_->zoomIn();
  }
}

void ApplicationCommands::menuZoomOut() {
  if (theWindow_ != nullptr && theDocument()) {
    theWindow_->zoomOut();
  }
}

bool ApplicationCommands::validateMenuItem(std::string_view action) const {
  const auto document = theDocument();
  const auto selected = document ? document->selectedLayer() : nullptr;
  if (action == menu_action::kReRandomizeBuckets) {
    return dynamic_cast<const PointLayer*>(selected.get()) != nullptr;
  }
  // Without a selected layer in the list there is no index: Next is off,
  // and Previous stays on though it then does nothing.
  if (action == menu_action::kLayerNext) {
    const auto index = selectedIndex();
    return index && *index + 1 < document->layers().size();
  }
  if (action == menu_action::kLayerPrevious) {
    const auto index = selectedIndex();
    return !index || *index != 0;
  }
  if (action == menu_action::kReSaveLayer) {
    return isPlainPointLayer(selected.get()) &&
           static_cast<const PointLayer&>(*selected).fileStoredAsLink();
  }
  return true;
}

// --- PreferenceController

std::string_view PreferenceController::keyForWell(Well well) {
  switch (well) {
    case Well::Grid:
      return kGridColorKey;
    case Well::Point:
      return kPointColorKey;
    case Well::Background:
      return kBackgroundColorKey;
    case Well::Frustum:
      return kFrustumColorKey;
    case Well::SelectedFrustum:
      return kSelectedFrustumColorKey;
  }
  return kGridColorKey;
}

std::shared_ptr<Color> PreferenceController::prefsColorNamed(std::string_view key) {
  return colorForDefaultsKey(UserDefaults::standardUserDefaults(), key);
}

std::array<std::shared_ptr<Color>, 5> PreferenceController::wellColors() const {
  std::array<std::shared_ptr<Color>, 5> colors;
  for (std::size_t i = 0; i < kWells.size(); ++i) {
    colors[i] = prefsColorNamed(keyForWell(kWells[i]));
  }
  return colors;
}

void PreferenceController::changePrefsColorFromColorWell(const Color& color, Well well) {
  setColorForDefaultsKey(UserDefaults::standardUserDefaults(), color, keyForWell(well));
  if (well != Well::Point) {
    NotificationCenter::defaultCenter().postNotificationName(
        std::string(kGridColorChangedNotification), this);
  }
}

namespace {

void chooseFolderForKey(std::string_view key) {
  const std::optional<std::string> folder =
      UserInteraction::shared().runOpenPanel(OpenPanel{"Choose", false, true, {}});
  if (folder) {
    UserDefaults::standardUserDefaults().setObjectForKey(*folder, key);
  }
}

}  // namespace

void PreferenceController::changeImagePath() { chooseFolderForKey(kImageSavePathKey); }

void PreferenceController::changePointProxyPath() { chooseFolderForKey(kPointCachePathKey); }

}  // namespace cloudreel
