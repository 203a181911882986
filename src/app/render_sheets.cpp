#include "app/render_sheets.h"

#include <QButtonGroup>
#include <QCheckBox>
#include <QCloseEvent>
#include <QComboBox>
#include <QDialogButtonBox>
#include <QDoubleSpinBox>
#include <QFormLayout>
#include <QHBoxLayout>
#include <QLabel>
#include <QLineEdit>
#include <QPointer>
#include <QProgressBar>
#include <QPushButton>
#include <QRadioButton>
#include <QSpinBox>
#include <QVBoxLayout>
#include <algorithm>
#include <cmath>

#include "platform/user_interaction.h"
#include "render/render_properties_controller.h"
#include "timeline/render_run.h"
#include "timeline/timeline.h"
#include "timeline/timeline_window_controller.h"

namespace cloudreel::app {

namespace {

// The largest side offered; larger framebuffers fail on most GPUs anyway.
constexpr int kLargestSide = 16384;

QDoubleSpinBox* planeBox(double value, const char* name) {
  auto* box = new QDoubleSpinBox;
  box->setObjectName(QString::fromLatin1(name));
  box->setDecimals(3);
  box->setRange(0.001, 1.0e6);
  box->setValue(value);
  return box;
}

QSpinBox* sideBox(int value, const char* name) {
  auto* box = new QSpinBox;
  box->setObjectName(QString::fromLatin1(name));
  box->setRange(1, kLargestSide);
  box->setValue(value);
  return box;
}

}  // namespace

// --- RenderSettingsSheet

RenderSettingsSheet::RenderSettingsSheet(RenderPropertiesController& settings, QWidget* window)
    : QDialog(window), settings_(settings) {
  setObjectName(QStringLiteral("RenderOutPropertiesSheet"));
  setWindowTitle(QStringLiteral("Render Settings"));
  setWindowModality(Qt::WindowModal);
  settings_.windowDidLoad();
  buildControls();
}

void RenderSettingsSheet::buildControls() {
  auto* form = new QFormLayout;

  // Each item carries its preset's index; item 0 is shown as the sheet
  // opens, matching the controller's initial size.
  presets_ = new QComboBox;
  presets_->setObjectName(QStringLiteral("presets"));
  for (std::size_t i = 0; i < kResolutionPresets.size(); ++i) {
    const ResolutionPreset& preset = kResolutionPresets[i];
    presets_->addItem(
        QStringLiteral("%1 (%2 × %3)")
            .arg(QString::fromUtf8(preset.label.data(), static_cast<int>(preset.label.size())))
            .arg(preset.width)
            .arg(preset.height),
        static_cast<int>(i));
  }
  presets_->setCurrentIndex(0);
  connect(presets_, &QComboBox::activated, this, &RenderSettingsSheet::presetChosen);
  form->addRow(QStringLiteral("Size:"), presets_);

  width_ = sideBox(settings_.width(), "width");
  height_ = sideBox(settings_.height(), "height");
  connect(width_, &QSpinBox::valueChanged, this, [this](int v) { settings_.setWidth(v); });
  connect(height_, &QSpinBox::valueChanged, this, [this](int v) { settings_.setHeight(v); });
  auto* size = new QHBoxLayout;
  size->addWidget(width_);
  size->addWidget(new QLabel(QStringLiteral("×")));
  size->addWidget(height_);
  form->addRow(QStringLiteral("Width × height:"), size);

  auto* zNear = planeBox(settings_.zNear(), "zNear");
  auto* zFar = planeBox(settings_.zFar(), "zFar");
  connect(zNear, &QDoubleSpinBox::valueChanged, this,
          [this](double v) { settings_.setZNear(static_cast<float>(v)); });
  connect(zFar, &QDoubleSpinBox::valueChanged, this,
          [this](double v) { settings_.setZFar(static_cast<float>(v)); });
  form->addRow(QStringLiteral("Near plane:"), zNear);
  form->addRow(QStringLiteral("Far plane:"), zFar);

  auto* stereo = new QCheckBox(QStringLiteral("Render a left and right pair"));
  stereo->setObjectName(QStringLiteral("stereo"));
  stereo->setChecked(settings_.renderInStereo());
  auto* separation = new QDoubleSpinBox;
  separation->setObjectName(QStringLiteral("stereoSeparation"));
  separation->setDecimals(3);
  separation->setRange(0.0, 1000.0);
  separation->setValue(settings_.stereoSeparation());
  auto* stereoType = new QComboBox;
  stereoType->setObjectName(QStringLiteral("stereoType"));
  stereoType->addItem(QStringLiteral("Parallel"), 0);
  stereoType->addItem(QStringLiteral("Cross-eyed"), 1);
  stereoType->setCurrentIndex(std::max(0, stereoType->findData(settings_.stereoType())));
  const auto stereoOn = [separation, stereoType](bool on) {
    separation->setEnabled(on);
    stereoType->setEnabled(on);
  };
  stereoOn(stereo->isChecked());
  connect(stereo, &QCheckBox::toggled, this, [this, stereoOn](bool on) {
    settings_.setRenderInStereo(on);
    stereoOn(on);
  });
  connect(separation, &QDoubleSpinBox::valueChanged, this,
          [this](double v) { settings_.setStereoSeparation(static_cast<float>(v)); });
  connect(stereoType, &QComboBox::activated, this, [this, stereoType](int item) {
    settings_.setStereoType(stereoType->itemData(item).toInt());
  });
  form->addRow(stereo);
  form->addRow(QStringLiteral("Eye separation:"), separation);
  form->addRow(QStringLiteral("Stereo type:"), stereoType);

  auto* depth = new QCheckBox(QStringLiteral("Also write a depth image a frame"));
  depth->setObjectName(QStringLiteral("depth"));
  depth->setChecked(settings_.shouldRenderDepth());
  connect(depth, &QCheckBox::toggled, this,
          [this](bool on) { settings_.setShouldRenderDepth(on); });
  form->addRow(depth);

  // The choices' ids are the selector's tags.
  auto* range = new QButtonGroup(this);
  auto* whole = new QRadioButton(QStringLiteral("The whole timeline"));
  whole->setObjectName(QStringLiteral("rangeWhole"));
  auto* marks = new QRadioButton(QStringLiteral("From the in to the out mark"));
  marks->setObjectName(QStringLiteral("rangeMarks"));
  range->addButton(whole, static_cast<int>(RenderRange::WholeTimeline));
  range->addButton(marks, static_cast<int>(RenderRange::Marks));
  (settings_.renderRangeSelected() == static_cast<int>(RenderRange::WholeTimeline) ? whole : marks)
      ->setChecked(true);
  connect(range, &QButtonGroup::idClicked, this,
          [this](int tag) { settings_.setRenderRangeSelected(tag); });
  auto* rangeRow = new QVBoxLayout;
  rangeRow->addWidget(whole);
  rangeRow->addWidget(marks);
  form->addRow(QStringLiteral("Frames:"), rangeRow);

  folder_ = new QLineEdit(QString::fromStdString(settings_.outputPath()));
  folder_->setObjectName(QStringLiteral("outputPath"));
  auto* choose = new QPushButton(QStringLiteral("Choose…"));
  choose->setObjectName(QStringLiteral("chooseFolder"));
  choose->setAutoDefault(false);
  connect(choose, &QPushButton::clicked, this, &RenderSettingsSheet::chooseFolder);
  auto* folderRow = new QHBoxLayout;
  folderRow->addWidget(folder_, 1);
  folderRow->addWidget(choose);
  form->addRow(QStringLiteral("Folder:"), folderRow);

  pattern_ = new QLineEdit(QString::fromStdString(settings_.outputPattern().text()));
  pattern_->setObjectName(QStringLiteral("outputPattern"));
  pattern_->setToolTip(
      QStringLiteral("The file name of each frame, with one %d (or %04d) "
                     "for its number"));
  form->addRow(QStringLiteral("File names:"), pattern_);

  auto* buttons = new QDialogButtonBox(QDialogButtonBox::Ok | QDialogButtonBox::Cancel);
  buttons->button(QDialogButtonBox::Ok)->setText(QStringLiteral("Render"));
  connect(buttons, &QDialogButtonBox::accepted, this, &RenderSettingsSheet::accept);
  connect(buttons, &QDialogButtonBox::rejected, this, &RenderSettingsSheet::reject);
  form->addRow(buttons);
  setLayout(form);
}

void RenderSettingsSheet::presetChosen(int item) {
  settings_.setResolutionPreset(presets_->itemData(item).toInt());
  width_->setValue(settings_.width());
  height_->setValue(settings_.height());
}

void RenderSettingsSheet::chooseFolder() {
  const auto chosen = UserInteraction::shared().runOpenPanel(
      OpenPanel{"Choose the Folder for the Frames", false, true, {}});
  if (chosen) {
    folder_->setText(QString::fromStdString(*chosen));
  }
}

int RenderSettingsSheet::runModal() { return exec() == QDialog::Accepted ? 1 : 0; }

void RenderSettingsSheet::accept() {
  // The two text fields are read as the sheet ends: a pattern is only
  // checked whole, and a half-typed folder is no folder.
  Error error;
  const auto pattern = FramePattern::parse(pattern_->text().toStdString(), &error);
  if (!pattern) {
    UserInteraction::shared().presentError(error);
    return;
  }
  settings_.setOutputPattern(*pattern);
  settings_.setOutputPath(folder_->text().trimmed().toStdString());
  if (!settings_.prepareForRender(&error)) {
    UserInteraction::shared().presentError(error);
    return;
  }
  QDialog::accept();
}

// --- RenderProgressSheet

RenderProgressSheet::RenderProgressSheet(std::shared_ptr<RenderProgressController> progress,
                                         QWidget* window)
    : QDialog(window), progress_(std::move(progress)) {
  setObjectName(QStringLiteral("RenderProgress"));
  setWindowTitle(QStringLiteral("Rendering"));
  setWindowModality(Qt::WindowModal);
  bar_ = new QProgressBar;
  bar_->setRange(0, 100);
  bar_->setValue(0);
  label_ = new QLabel(QStringLiteral("Starting…"));
  label_->setMinimumWidth(240);
  cancel_ = new QPushButton(QStringLiteral("Cancel"));
  cancel_->setAutoDefault(false);
  connect(cancel_, &QPushButton::clicked, this, [this] { progress_->cancelButtonClicked(); });
  auto* layout = new QVBoxLayout(this);
  layout->addWidget(label_);
  layout->addWidget(bar_);
  auto* buttons = new QHBoxLayout;
  buttons->addStretch(1);
  buttons->addWidget(cancel_);
  layout->addLayout(buttons);
  progress_->setChangeHandler([this] { refresh(); });
}

RenderProgressSheet::~RenderProgressSheet() { progress_->setChangeHandler(nullptr); }

void RenderProgressSheet::refresh() {
  // The bar's value may be anything a division gives; a value that is not
  // a number shows as an empty bar.
  // The label first, so that whoever follows the bar reads the matching one.
  QString text = QString::fromStdString(progress_->label());
  if (progress_->hasCancelled()) {
    cancel_->setEnabled(false);
    text += QStringLiteral(" (stopping after this frame)");
  }
  label_->setText(text);
  const double value = progress_->barValue();
  bar_->setValue(std::isfinite(value) ? static_cast<int>(std::clamp(value, 0.0, 100.0)) : 0);
}

void RenderProgressSheet::finish() {
  finished_ = true;
  close();
}

void RenderProgressSheet::reject() {
  if (finished_) {
    QDialog::reject();
    return;
  }
  progress_->cancelButtonClicked();
}

void RenderProgressSheet::closeEvent(QCloseEvent* event) {
  if (!finished_) {
    progress_->cancelButtonClicked();
    event->ignore();
    return;
  }
  QDialog::closeEvent(event);
}

// --- the render command

RenderProgressSheet* runTimelineRender(QWidget* window, TimelineWindowController& timeline) {
  const std::shared_ptr<Timeline> animation = timeline.timeline();
  if (timeline.document() == nullptr || !animation) {
    UserInteraction::shared().beep();
    return nullptr;
  }
  RenderPropertiesController settings;
  {
    RenderSettingsSheet sheet(settings, window);
    if (sheet.runModal() == 0) {
      return nullptr;
    }
  }
  // The run reports its end from the main loop, never from inside
  // renderTimeline, so the sheet it closes can be made once it has started.
  auto progress = std::make_shared<RenderProgressController>();
  auto shown = std::make_shared<QPointer<RenderProgressSheet>>();
  Error error;
  const auto run = timeline.renderTimeline(
      settings, progress,
      [shown](bool) {
        if (*shown) {
          (*shown)->finish();
        }
      },
      &error);
  if (!run) {
    if (error.message.empty()) {
      UserInteraction::shared().beep();
    } else {
      UserInteraction::shared().runAlert(Alert{"The render cannot start", error.message, {}});
    }
    return nullptr;
  }
  auto* sheet = new RenderProgressSheet(progress, window);
  sheet->setAttribute(Qt::WA_DeleteOnClose);
  sheet->open();
  *shown = sheet;
  return sheet;
}

}  // namespace cloudreel::app
