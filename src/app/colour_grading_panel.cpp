#include "app/colour_grading_panel.h"

#include <QCloseEvent>
#include <QFormLayout>
#include <QHBoxLayout>
#include <QLabel>
#include <QPushButton>
#include <QSlider>
#include <QVBoxLayout>
#include <cmath>

#include "scene/point_layer.h"

namespace cloudreel::app {

namespace {

struct SliderRange {
  const char* title;
  const char* name;
  int minimum, maximum;  // hundredths
};

// The ranges of ColourGrade, in hundredths.
constexpr SliderRange kSliders[] = {{"Brightness", "brightness", -100, 100},
                                    {"Contrast", "contrast", 0, 400},
                                    {"Saturation", "saturation", 0, 400},
                                    {"Gamma", "gamma", 10, 1000}};

int hundredths(float v) { return static_cast<int>(std::lround(v * 100.0f)); }

}  // namespace

ColourGradingPanel::ColourGradingPanel(const std::shared_ptr<MyDocument>& document) {
  setWindowFlags(Qt::Tool);
  setWindowTitle(QStringLiteral("Colour Grading"));
  setObjectName(QStringLiteral("colourGradingPanel"));
  setMinimumWidth(320);
  auto* layout = new QVBoxLayout(this);
  layerName_ = new QLabel;
  layout->addWidget(layerName_);
  auto* form = new QFormLayout;
  for (std::size_t i = 0; i < sliders_.size(); ++i) {
    sliders_[i] = new QSlider(Qt::Horizontal);
    sliders_[i]->setObjectName(QString::fromUtf8(kSliders[i].name));
    sliders_[i]->setRange(kSliders[i].minimum, kSliders[i].maximum);
    sliders_[i]->setSingleStep(1);
    sliders_[i]->setPageStep(10);
    values_[i] = new QLabel;
    values_[i]->setMinimumWidth(40);
    auto* row = new QHBoxLayout;
    row->addWidget(sliders_[i], 1);
    row->addWidget(values_[i]);
    form->addRow(QString::fromUtf8(kSliders[i].title), row);
    connect(sliders_[i], &QSlider::valueChanged, this, [this] { slidersMoved(); });
  }
  layout->addLayout(form);
  auto* buttons = new QHBoxLayout;
  cancel_ = new QPushButton(QStringLiteral("Cancel"));
  apply_ = new QPushButton(QStringLiteral("Apply"));
  buttons->addStretch(1);
  buttons->addWidget(cancel_);
  buttons->addWidget(apply_);
  layout->addLayout(buttons);
  connect(apply_, &QPushButton::clicked, this, [this] { controller_.apply(); });
  connect(cancel_, &QPushButton::clicked, this, [this] { controller_.cancel(); });
  controller_.setDocument(document);
  controller_.setView(this);
}

ColourGradingPanel::~ColourGradingPanel() { controller_.setView(nullptr); }

void ColourGradingPanel::closeEvent(QCloseEvent* event) {
  controller_.cancel();
  QWidget::closeEvent(event);
}

void ColourGradingPanel::slidersMoved() {
  if (showing_) {
    return;
  }
  const auto at = [this](int i) { return static_cast<float>(sliders_[i]->value()) / 100.0f; };
  controller_.setGrade({at(0), at(1), at(2), at(3)});
}

void ColourGradingPanel::reloadGrade() {
  const auto layer = controller_.layer();
  layerName_->setText(layer
                          ? QString::fromStdString(layer->name().empty() ? "Points" : layer->name())
                          : QStringLiteral("No point layer selected"));
  const ColourGrade& grade = controller_.grade();
  const float values[] = {grade.brightness, grade.contrast, grade.saturation, grade.gamma};
  showing_ = true;
  for (std::size_t i = 0; i < sliders_.size(); ++i) {
    sliders_[i]->setValue(hundredths(values[i]));
    sliders_[i]->setEnabled(layer != nullptr);
    values_[i]->setText(QString::number(static_cast<double>(values[i]), 'f', 2));
  }
  showing_ = false;
  apply_->setEnabled(controller_.isPreviewing());
  cancel_->setEnabled(controller_.isPreviewing());
}

}  // namespace cloudreel::app
