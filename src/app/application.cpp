#include "app/application.h"

#include <QApplication>
#include <QCheckBox>
#include <QDialog>
#include <QDialogButtonBox>
#include <QDoubleSpinBox>
#include <QFileDialog>
#include <QFormLayout>
#include <QImage>
#include <QProgressDialog>
#include <QScopeGuard>
#include <QSpinBox>
#include <QTimer>
#include <algorithm>

#include "app/cameras_panel.h"
#include "app/colour_grading_panel.h"
#include "app/document_window.h"
#include "app/gl_view_widget.h"
#include "app/import_options_panel.h"
#include "app/paths_panel.h"
#include "app/photograph_window.h"
#include "app/preferences_window.h"
#include "app/property_panel.h"
#include "app/qt_gl_context.h"
#include "app/timeline_window.h"
#include "app/view_controls_panel.h"
#include "platform/log.h"
#include "platform/notification_center.h"
#include "platform/user_defaults.h"
#include "render/camera_path_render.h"
#include "scene/my_document.h"

namespace cloudreel::app {

Application::Application(Options options)
    : options_(std::move(options)),
      bridge_(RunLoop::main()),
      shareGroup_(std::make_shared<gl::ShareGroup>()) {
  commands_.setBackgroundReading(&importQueue_, &RunLoop::main());
  commands_.setImportsChangedHandler([this] { importsChanged(); });
}

Application::~Application() {
  commands_.setImportsChangedHandler(nullptr);
  // The panels go before the windows whose documents and views they show.
  timeline_.reset();
  camerasPanel_.reset();
  pathsPanel_.reset();
  viewControls_.reset();
  photographWindow_.reset();
  delete importProgress_;
  for (DocumentWindow* window : std::vector<DocumentWindow*>(windows_)) {
    window->setAttribute(Qt::WA_DeleteOnClose, false);
    delete window;
  }
}

bool Application::launch() {
  commands_.applicationDidFinishLaunching(nullptr);
  DocumentWindow* first = nullptr;
  for (const auto& path : options_.files) {
    DocumentWindow* window = openFile(path);
    first = first != nullptr ? first : window;
  }
  if (options_.files.empty() &&
      (options_.screenshot || commands_.applicationShouldOpenUntitledFile())) {
    first = newDocument();
  }
  if (options_.screenshot) {
    if (first == nullptr) {
      exitStatus_ = 1;
      return false;
    }
    takeScreenshot(*first);
  }
  return true;
}

int Application::nextUntitledNumber() { return ++untitledCount_; }

void Application::giveContext(DocumentSession& session) {
  Error error;
  std::shared_ptr<gl::GLContext> context = QtGLContext::create(shareGroup_, &error);
  if (!context) {
    logErrorf("no OpenGL context for the document: %s", error.message);
    return;
  }
  session.document()->setSharedGLContext(std::move(context));
}

DocumentWindow* Application::makeWindow(std::shared_ptr<DocumentSession> session) {
  DocumentSession* raw = session.get();
  raw->setEditedHandler([this, raw] {
    for (DocumentWindow* window : windows_) {
      if (window->session().get() == raw) {
        window->updateTitle();
      }
    }
  });
  auto* window = new DocumentWindow(*this, std::move(session));
  windows_.push_back(window);
  window->resize(options_.windowWidth, options_.windowHeight);
  window->show();
  window->activateWindow();
  windowDidBecomeMain(*window);
  return window;
}

DocumentWindow* Application::newDocument() {
  auto session = std::make_shared<DocumentSession>(nextUntitledNumber());
  giveContext(*session);
  return makeWindow(std::move(session));
}

DocumentWindow* Application::openFile(const std::filesystem::path& path) {
  const std::filesystem::path absolute = std::filesystem::absolute(path).lexically_normal();
  std::optional<ImportRequest> request = importRequestForFile(
      absolute, ImportOptions::fromDefaults(UserDefaults::standardUserDefaults()));
  if (request) {
    // A point file or reconstruction becomes the first layer of a new
    // document, read in the background like any import, its cameras kept
    // as the reconstruction import keeps them.
    request->storeCameras = request->kind == ImportRequest::Kind::Bundler;
    DocumentWindow* window = newDocument();
    commands_.documentWindowDidActivate(window);
    commands_.runImport(std::move(*request));
    return window;
  }
  for (DocumentWindow* window : windows_) {
    if (window->session()->fileURL() == absolute) {
      window->raise();
      window->activateWindow();
      return window;
    }
  }
  Error error;
  std::unique_ptr<DocumentSession> session = DocumentSession::open(absolute, &error);
  if (!session) {
    UserInteraction::shared().presentError(error);
    return nullptr;
  }
  giveContext(*session);
  noteRecentDocument(absolute);
  return makeWindow(std::move(session));
}

void Application::openDocumentWithPanel() {
  const auto chosen = UserInteraction::shared().runOpenPanel(
      OpenPanel{"Open", true, false, {std::string(kDocumentExtension), "rwb", "ply", "out"}});
  if (chosen) {
    openFile(*chosen);
  }
}

void Application::openNewView(DocumentWindow& window) { makeWindow(window.session()); }

std::vector<std::filesystem::path> Application::recentDocuments() const {
  return RecentDocuments(UserDefaults::standardUserDefaults()).urls();
}

void Application::clearRecentDocuments() {
  RecentDocuments(UserDefaults::standardUserDefaults()).clear();
  emit recentDocumentsChanged();
}

void Application::noteRecentDocument(const std::filesystem::path& path) {
  RecentDocuments(UserDefaults::standardUserDefaults()).noteURL(path);
  emit recentDocumentsChanged();
}

void Application::windowDidBecomeMain(DocumentWindow& window) {
  // A main window stays main while a dialog it opened is in front; only
  // another document window takes its place.
  if (mainWindow_ == &window) {
    return;
  }
  NotificationCenter& center = NotificationCenter::defaultCenter();
  if (mainWindow_ != nullptr) {
    center.postNotificationName(std::string(kDocumentDeactivateNotification),
                                static_cast<const DocumentWindowController*>(mainWindow_));
  }
  mainWindow_ = &window;
  center.postNotificationName(std::string(kDocumentActivateNotification),
                              static_cast<const DocumentWindowController*>(&window));
}

bool Application::windowShouldClose(DocumentWindow& window) {
  const auto sameDocument = std::count_if(windows_.begin(), windows_.end(), [&](auto* other) {
    return other->session() == window.session();
  });
  return sameDocument > 1 || window.session()->canClose();
}

void Application::windowWillClose(DocumentWindow& window) {
  if (mainWindow_ == &window) {
    NotificationCenter::defaultCenter().postNotificationName(
        std::string(kDocumentDeactivateNotification),
        static_cast<const DocumentWindowController*>(&window));
    mainWindow_ = nullptr;
  }
  std::erase(windows_, &window);
  // The last window of a document closes the document: the panels let go.
  if (std::none_of(windows_.begin(), windows_.end(),
                   [&](auto* other) { return other->session() == window.session(); })) {
    window.document()->close();
  }
  if (windows_.empty() && !terminating_ &&
      commands_.applicationShouldTerminateAfterLastWindowClosed()) {
    QTimer::singleShot(0, qApp, &QApplication::quit);
  }
}

void Application::terminate() {
  terminating_ = true;
  for (DocumentWindow* window : std::vector<DocumentWindow*>(windows_)) {
    if (!window->close()) {
      terminating_ = false;
      return;  // the user kept a document open
    }
  }
  QTimer::singleShot(0, qApp, &QApplication::quit);
}

void Application::showPreferences() {
  if (!preferences_) {
    preferences_ = std::make_unique<PreferencesWindow>();
  }
  preferences_->show();
  preferences_->raise();
}

namespace {

template <typename Panel, typename... Args>
void showPanel(std::unique_ptr<Panel>& panel, Args&&... args) {
  if (!panel) {
    panel = std::make_unique<Panel>(std::forward<Args>(args)...);
  }
  panel->show();
  panel->raise();
}

}  // namespace

void Application::showTimeline() { showPanel(timeline_, *this); }

void Application::showCamerasPanel() {
  showPanel(camerasPanel_, mainWindow_ != nullptr ? mainWindow_->document() : nullptr);
}

void Application::showPathsPanel() {
  showPanel(pathsPanel_, mainWindow_ != nullptr ? mainWindow_->document() : nullptr);
}

void Application::showViewControls() { showPanel(viewControls_, *this); }

void Application::showPhotographWindow() {
  showPanel(photographWindow_, mainWindow_ != nullptr ? mainWindow_->document() : nullptr);
}

void Application::showPropertyPanel() {
  showPanel(propertyPanel_, mainWindow_ != nullptr ? mainWindow_->document() : nullptr);
}

void Application::showColourGradingPanel() {
  showPanel(colourGradingPanel_, mainWindow_ != nullptr ? mainWindow_->document() : nullptr);
}

void Application::runPLYOptionsSheet() {
  QDialog sheet(QApplication::activeWindow());
  sheet.setWindowTitle(QStringLiteral("PLY Options"));
  auto* layout = new QFormLayout(&sheet);
  auto* downsample = new QCheckBox(QStringLiteral("Keep one vertex in every"));
  downsample->setChecked(commands_.plyShallDownsample());
  auto* factor = new QSpinBox;
  factor->setRange(1, 1'000'000);
  factor->setValue(std::max(1, commands_.plyDownsample()));
  layout->addRow(downsample, factor);
  auto* buttons = new QDialogButtonBox(QDialogButtonBox::Ok | QDialogButtonBox::Cancel);
  QObject::connect(buttons, &QDialogButtonBox::accepted, &sheet, &QDialog::accept);
  QObject::connect(buttons, &QDialogButtonBox::rejected, &sheet, &QDialog::reject);
  layout->addRow(buttons);
  sheet.exec();
  // Either button finishes the import with what the controls hold.
  commands_.setPLYShallDownsample(downsample->isChecked());
  commands_.setPLYDownsample(factor->value());
  commands_.endPLYOptionsSheet();
}

void Application::runReRandomizeSheet() {
  QDialog sheet(QApplication::activeWindow());
  sheet.setWindowTitle(QStringLiteral("Re-randomize Buckets"));
  auto* layout = new QFormLayout(&sheet);
  auto* exponent = new QDoubleSpinBox;
  exponent->setRange(0.01, 100.0);
  exponent->setDecimals(2);
  exponent->setValue(1.0);
  layout->addRow(QStringLiteral("Exponent:"), exponent);
  auto* buttons = new QDialogButtonBox(QDialogButtonBox::Ok | QDialogButtonBox::Cancel);
  QObject::connect(buttons, &QDialogButtonBox::accepted, &sheet, &QDialog::accept);
  QObject::connect(buttons, &QDialogButtonBox::rejected, &sheet, &QDialog::reject);
  layout->addRow(buttons);
  const int code = sheet.exec() == QDialog::Accepted ? 0 : 1;
  commands_.endReRandomizeOptionsSheet(code, static_cast<float>(exponent->value()));
}

void Application::renderCameraPath(DocumentWindow& window) {
  std::optional<CameraPathRenderResult> result;
  {
    // The frames are drawn on this thread, without progress: the cursor
    // says the application is busy until they are written.
    QApplication::setOverrideCursor(Qt::WaitCursor);
    const auto restore = qScopeGuard([] { QApplication::restoreOverrideCursor(); });
    result = renderSelectedCameraPath(*window.document(), window.glView().pointView().glScene());
  }
  if (!result) {
    UserInteraction::shared().beep();
    return;
  }
  UserInteraction::shared().runAlert(cameraPathRenderAlert(*result));
}

void Application::customizeOpenPanel(QFileDialog& dialog) {
  if (!commands_.importPanelRunning()) {
    return;
  }
  auto* options = new ImportOptionsPanel(
      [this](const std::filesystem::path& selected) {
        return commands_.openPanelOptionsView(selected);
      },
      &dialog);
  options->attachTo(dialog);
}

QProgressDialog* Application::importProgress() const { return importProgress_; }

void Application::importsChanged() {
  const auto& files = commands_.filesBeingRead();
  if (files.empty()) {
    delete importProgress_;
    return;
  }
  if (!importProgress_) {
    // Not modal: the windows stay usable while the files are read, and the
    // layers appear as each read finishes. Reading cannot be interrupted,
    // so there is nothing to cancel.
    importProgress_ = new QProgressDialog(mainWindow_);
    importProgress_->setWindowTitle(QStringLiteral("Importing"));
    importProgress_->setCancelButton(nullptr);
    importProgress_->setRange(0, 0);
    importProgress_->setMinimumDuration(500);
    importProgress_->setAutoClose(false);
    importProgress_->setAutoReset(false);
  }
  const QString first = QString::fromStdString(files.front().filename().string());
  importProgress_->setLabelText(
      files.size() == 1
          ? QStringLiteral("Reading %1…").arg(first)
          : QStringLiteral("Reading %1 and %2 more…").arg(first).arg(files.size() - 1));
}

void Application::takeScreenshot(DocumentWindow& window) {
  // Once the window is on screen and every import has been read, one frame
  // is drawn and saved.
  auto* poll = new QTimer(this);
  QObject::connect(poll, &QTimer::timeout, this, [this, poll, &window] {
    if (!window.isVisible() || commands_.importsInProgress() > 0) {
      return;
    }
    poll->stop();
    poll->deleteLater();
    const QImage image = window.glView().grabFramebuffer();
    const std::string path = options_.screenshot->string();
    if (image.isNull() || !image.save(QString::fromStdString(path), "PNG")) {
      logErrorf("cannot save the screenshot to %s", path);
      exitStatus_ = 1;
    }
    QApplication::exit(exitStatus_);
  });
  poll->start(20);
}

}  // namespace cloudreel::app
