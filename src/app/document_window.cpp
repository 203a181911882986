#include "app/document_window.h"

#include <QCheckBox>
#include <QCloseEvent>
#include <QDockWidget>
#include <QHeaderView>
#include <QLabel>
#include <QSlider>
#include <QTreeView>
#include <QVBoxLayout>
#include <cmath>

#include "app/application.h"
#include "app/document_menus.h"
#include "app/gl_view_widget.h"
#include "app/layer_outline_model.h"
#include "platform/log.h"
#include "platform/notification_center.h"

namespace cloudreel::app {

namespace {

// The fraction slider's steps: a thousandth of the buckets each.
constexpr int kFractionSteps = 1000;

}  // namespace

DocumentWindow::DocumentWindow(Application& application, std::shared_ptr<DocumentSession> session)
    : application_(application), session_(std::move(session)) {
  setAttribute(Qt::WA_DeleteOnClose);
  glView_ = new GLViewWidget(application_.shareGroup(), this);
  glView_->pointView().setDocument(document().get());
  setCentralWidget(glView_);
  buildPanels();
  buildDocumentMenus(*this, application_);
  logf("windowcontrollerdidloadNib:%s", windowTitle().toStdString());

  NotificationCenter::defaultCenter().addObserver(
      *this, std::string(kDocumentChangeNotification), document().get(),
      [this](const Notification&) { refreshPanels(); });
  NotificationCenter::defaultCenter().addObserver(
      *this, std::string(kDocumentCloseNotification), document().get(),
      [this](const Notification&) { close(); });
  updateTitle();
}

DocumentWindow::~DocumentWindow() {
  NotificationCenter::defaultCenter().removeObserver(*this);
  glView_->pointView().setDocument(nullptr);
}

void DocumentWindow::buildPanels() {
  MyDocument& doc = *document();
  outline_ = std::make_unique<LayerOutlineModel>(doc);
  layersView_ = new QTreeView;
  layersView_->setModel(outline_.get());
  layersView_->setHeaderHidden(false);
  layersView_->header()->setStretchLastSection(false);
  layersView_->header()->setSectionResizeMode(0, QHeaderView::Stretch);
  layersView_->setEditTriggers(QAbstractItemView::DoubleClicked | QAbstractItemView::EditKeyPressed);
  connect(layersView_->selectionModel(), &QItemSelectionModel::currentRowChanged, this,
          [this](const QModelIndex& current) { layerClicked(current); });

  overrideBuckets_ = new QCheckBox(QStringLiteral("Override bucket limits"));
  bucketFraction_ = new QSlider(Qt::Horizontal);
  bucketFraction_->setRange(0, kFractionSteps);
  connect(overrideBuckets_, &QCheckBox::toggled, this, [this](bool on) {
    if (document()->overrideBuckets().value_or(false) != on) {
      document()->setOverrideBuckets(on);
      document()->hasChanged();
    }
  });
  connect(bucketFraction_, &QSlider::valueChanged, this, [this](int value) {
    const float fraction = static_cast<float>(value) / kFractionSteps;
    if (document()->bucketOverrideFraction().value_or(0.0f) != fraction) {
      document()->setBucketOverrideFraction(fraction);
      document()->hasChanged();
    }
  });

  auto* panel = new QWidget;
  auto* layout = new QVBoxLayout(panel);
  layout->addWidget(layersView_, 1);
  layout->addWidget(overrideBuckets_);
  layout->addWidget(new QLabel(QStringLiteral("Fraction of points drawn")));
  layout->addWidget(bucketFraction_);
  auto* dock = new QDockWidget(QStringLiteral("Layers"), this);
  dock->setObjectName(QStringLiteral("layers"));
  dock->setWidget(panel);
  addDockWidget(Qt::LeftDockWidgetArea, dock);
  refreshPanels();
}

void DocumentWindow::refreshPanels() {
  outline_->reloadData();
  followSelectedLayer();
  const QSignalBlocker blockOverride(overrideBuckets_);
  const QSignalBlocker blockFraction(bucketFraction_);
  overrideBuckets_->setChecked(document()->overrideBuckets().value_or(false));
  bucketFraction_->setValue(static_cast<int>(
      std::lround(document()->bucketOverrideFraction().value_or(0.0f) * kFractionSteps)));
}

void DocumentWindow::followSelectedLayer() {
  const QModelIndex index = outline_->indexForLayer(document()->selectedLayer().get());
  if (index != layersView_->currentIndex()) {
    const QSignalBlocker block(layersView_->selectionModel());
    layersView_->setCurrentIndex(index);
  }
}

void DocumentWindow::layerClicked(const QModelIndex& index) {
  const std::shared_ptr<Layer> layer = outline_->layerAtIndex(index);
  if (layer != document()->selectedLayer()) {
    document()->setSelectedLayer(layer);
    application_.commands().setCurrentLayer(layer);
  }
}

void DocumentWindow::zoomIn() { glView_->pointView().zoomIn(); }
void DocumentWindow::zoomOut() { glView_->pointView().zoomOut(); }

void DocumentWindow::updateTitle() {
  setWindowTitle(QString::fromStdString(session_->displayName()) + QStringLiteral("[*]"));
  setWindowModified(session_->isDocumentEdited());
}

void DocumentWindow::save() {
  Error error;
  if (session_->save(&error)) {
    application_.noteRecentDocument(*session_->fileURL());
  } else if (!error.message.empty()) {
    UserInteraction::shared().presentError(error);
  }
  updateTitle();
}

void DocumentWindow::saveAs() {
  Error error;
  if (session_->saveAs(&error)) {
    application_.noteRecentDocument(*session_->fileURL());
  } else if (!error.message.empty()) {
    UserInteraction::shared().presentError(error);
  }
  updateTitle();
}

void DocumentWindow::revert() {
  Error error;
  if (!session_->revertToSaved(&error) && !error.message.empty()) {
    UserInteraction::shared().presentError(error);
  }
  refreshPanels();
  updateTitle();
}

void DocumentWindow::changeEvent(QEvent* event) {
  if (event->type() == QEvent::ActivationChange && isActiveWindow()) {
    application_.windowDidBecomeMain(*this);
  }
  QMainWindow::changeEvent(event);
}

void DocumentWindow::closeEvent(QCloseEvent* event) {
  if (!application_.windowShouldClose(*this)) {
    event->ignore();
    return;
  }
  application_.windowWillClose(*this);
  event->accept();
}

}  // namespace cloudreel::app
