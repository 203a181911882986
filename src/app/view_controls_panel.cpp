#include "app/view_controls_panel.h"

#include <QCheckBox>
#include <QComboBox>
#include <QDoubleSpinBox>
#include <QFormLayout>
#include <QGroupBox>
#include <QHBoxLayout>
#include <QLabel>
#include <QPushButton>
#include <QSignalBlocker>
#include <QVBoxLayout>

#include "app/application.h"
#include "app/document_window.h"
#include "app/gl_view_widget.h"
#include "scene/application_commands.h"

namespace cloudreel::app {

namespace {

QComboBox* comboOf(const std::vector<std::string>& titles) {
  auto* combo = new QComboBox;
  for (const auto& title : titles) {
    combo->addItem(QString::fromStdString(title));
  }
  return combo;
}

std::shared_ptr<PointsDocumentGLView> viewOf(DocumentWindow* window) {
  if (window == nullptr) {
    return nullptr;
  }
  // The view is shared-owned by its widget; the controller keeps a weak
  // reference, so a window that goes first leaves it with none.
  return std::static_pointer_cast<PointsDocumentGLView>(
      window->glView().pointView().shared_from_this());
}

}  // namespace

ViewControlsPanel::ViewControlsPanel(Application& application, QWidget* parent)
    : QWidget(parent, Qt::Tool), application_(application) {
  setWindowTitle(QStringLiteral("View Controls"));
  auto* layout = new QVBoxLayout(this);

  auto* viewBox = new QGroupBox(QStringLiteral("View"));
  auto* viewForm = new QFormLayout(viewBox);
  viewMode_ = comboOf(ViewControlsController::viewModeTitles());
  viewForm->addRow(QStringLiteral("Mode:"), viewMode_);
  glasses_ = comboOf(ViewControlsController::glassesTitles());
  viewForm->addRow(QStringLiteral("Glasses:"), glasses_);
  eyeSeparation_ = new QDoubleSpinBox;
  eyeSeparation_->setRange(-50.0, 50.0);
  eyeSeparation_->setSingleStep(0.1);
  viewForm->addRow(QStringLiteral("Eye separation:"), eyeSeparation_);
  cameraMode_ = comboOf(ViewControlsController::cameraModeTitles());
  viewForm->addRow(QStringLiteral("Camera:"), cameraMode_);
  layout->addWidget(viewBox);

  auto* playBox = new QGroupBox(QStringLiteral("Camera Path"));
  auto* playForm = new QFormLayout(playBox);
  paths_ = new QComboBox;
  playForm->addRow(QStringLiteral("Path:"), paths_);
  fps_ = new QDoubleSpinBox;
  fps_->setRange(1.0, 240.0);
  fps_->setDecimals(1);
  playForm->addRow(QStringLiteral("Frames per second:"), fps_);
  loop_ = new QCheckBox(QStringLiteral("Loop"));
  playForm->addRow(loop_);
  auto* buttons = new QHBoxLayout;
  play_ = new QPushButton(QStringLiteral("Play"));
  stop_ = new QPushButton(QStringLiteral("Stop"));
  step_ = new QPushButton(QStringLiteral("Step"));
  render_ = new QPushButton(QStringLiteral("Render"));
  for (QPushButton* button : {play_, stop_, step_, render_}) {
    buttons->addWidget(button);
  }
  playForm->addRow(buttons);
  frame_ = new QLabel;
  playForm->addRow(QStringLiteral("Frame:"), frame_);
  layout->addWidget(playBox);
  layout->addStretch();

  connect(viewMode_, &QComboBox::activated, this,
          [this](int index) { controller_.setViewMode(index); });
  connect(glasses_, &QComboBox::activated, this,
          [this](int index) { controller_.setGlassesType(index + 1); });
  connect(eyeSeparation_, &QDoubleSpinBox::valueChanged, this, [this](double v) {
    if (!reloading_) {
      controller_.setEyeSeparation(static_cast<float>(v));
    }
  });
  connect(cameraMode_, &QComboBox::activated, this,
          [this](int index) { controller_.setCameraMode(index); });
  connect(paths_, &QComboBox::activated, this, [this](int index) {
    if (index >= 0) {
      controller_.selectPath(static_cast<std::size_t>(index));
    }
  });
  connect(fps_, &QDoubleSpinBox::valueChanged, this, [this](double v) {
    if (!reloading_) {
      controller_.setFramesPerSecond(static_cast<float>(v));
    }
  });
  connect(loop_, &QCheckBox::toggled, this, [this](bool on) {
    if (!reloading_) {
      controller_.setLoopAnimation(on);
    }
  });
  connect(play_, &QPushButton::clicked, this, [this] { controller_.play(); });
  connect(stop_, &QPushButton::clicked, this, [this] { controller_.stop(); });
  connect(step_, &QPushButton::clicked, this, [this] { controller_.step(); });
  connect(render_, &QPushButton::clicked, this, [this] {
    DocumentWindow* window = application_.mainWindow();
    if (window != nullptr && controller_.selectPathForRender()) {
      application_.renderCameraPath(*window);
    }
  });

  NotificationCenter& center = NotificationCenter::defaultCenter();
  center.addObserver(
      activation_, std::string(kDocumentActivateNotification), nullptr,
      [this](const Notification& n) {
        const auto* controller = static_cast<const DocumentWindowController*>(n.object);
        auto* window =
            dynamic_cast<DocumentWindow*>(const_cast<DocumentWindowController*>(controller));
        controller_.setView(viewOf(window));
      });
  center.addObserver(activation_, std::string(kDocumentDeactivateNotification), nullptr,
                     [this](const Notification&) { controller_.setView(nullptr); });

  resize(320, 380);
  controller_.setReloadHandler([this] { reload(); });
  followMainWindow();
  reload();
}

ViewControlsPanel::~ViewControlsPanel() {
  NotificationCenter::defaultCenter().removeObserver(activation_);
}

void ViewControlsPanel::followMainWindow() {
  DocumentWindow* window = application_.mainWindow();
  controller_.setDocument(window != nullptr ? window->document() : nullptr);
  controller_.setView(viewOf(window));
}

void ViewControlsPanel::reload() {
  reloading_ = true;
  const bool hasView = controller_.view() != nullptr;
  for (QWidget* widget : std::initializer_list<QWidget*>{viewMode_, glasses_, eyeSeparation_,
                                                         cameraMode_, fps_, loop_, stop_}) {
    widget->setEnabled(hasView);
  }
  viewMode_->setCurrentIndex(controller_.viewMode());
  glasses_->setCurrentIndex(controller_.glassesType() - 1);
  glasses_->setEnabled(hasView && controller_.viewMode() == PointsDocumentGLView::kAnaglyph);
  eyeSeparation_->setValue(controller_.eyeSeparation());
  cameraMode_->setCurrentIndex(controller_.cameraMode());
  fps_->setValue(controller_.framesPerSecond());
  loop_->setChecked(controller_.loopAnimation());

  QStringList titles;
  for (const auto& title : controller_.playablePathTitles()) {
    titles << QString::fromStdString(title);
  }
  QStringList shown;
  for (int i = 0; i < paths_->count(); ++i) {
    shown << paths_->itemText(i);
  }
  if (shown != titles) {
    const QSignalBlocker blocker(paths_);
    paths_->clear();
    paths_->addItems(titles);
  }
  const auto chosen = controller_.selectedPathIndex();
  paths_->setCurrentIndex(chosen ? static_cast<int>(*chosen) : -1);
  const bool canPlay = hasView && chosen.has_value();
  play_->setEnabled(canPlay);
  step_->setEnabled(canPlay);
  render_->setEnabled(canPlay);
  play_->setText(controller_.isPlaying() ? QStringLiteral("Restart") : QStringLiteral("Play"));
  frame_->setText(QString::number(controller_.animframe()));
  reloading_ = false;
}

}  // namespace cloudreel::app
