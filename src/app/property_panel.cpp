#include "app/property_panel.h"

#include <QCheckBox>
#include <QColorDialog>
#include <QComboBox>
#include <QDoubleSpinBox>
#include <QFormLayout>
#include <QGroupBox>
#include <QLabel>
#include <QLineEdit>
#include <QPushButton>
#include <QSpinBox>
#include <QVBoxLayout>

#include "platform/color.h"

namespace cloudreel::app {

namespace {

QColor qColor(const Color& color) {
  return QColor::fromRgbF(color.red(), color.green(), color.blue(), color.alpha());
}

}  // namespace

PropertyPanel::PropertyPanel(const std::shared_ptr<MyDocument>& document) {
  setWindowFlags(Qt::Tool);
  setObjectName(QStringLiteral("propertyPanel"));
  setMinimumWidth(300);
  layout_ = new QVBoxLayout(this);
  empty_ = new QLabel(QStringLiteral("Nothing to edit"));
  empty_->setAlignment(Qt::AlignCenter);
  layout_->addWidget(empty_);
  controller_.setDocument(document);
  controller_.setView(this);
}

PropertyPanel::~PropertyPanel() { controller_.setView(nullptr); }

void PropertyPanel::reloadSheet() {
  setWindowTitle(QString::fromStdString(controller_.title()));
  controls_.clear();
  if (body_ != nullptr) {
    // Later: the edit that caused the reload may come from one of its
    // controls, which is still delivering its signal.
    body_->hide();
    body_->deleteLater();
    body_ = nullptr;
  }
  const auto& sections = controller_.sections();
  empty_->setVisible(sections.empty());
  if (sections.empty()) {
    return;
  }
  body_ = new QWidget;
  auto* bodyLayout = new QVBoxLayout(body_);
  bodyLayout->setContentsMargins(0, 0, 0, 0);
  for (std::size_t s = 0; s < sections.size(); ++s) {
    auto* group = new QGroupBox(QString::fromStdString(sections[s].title));
    auto* form = new QFormLayout(group);
    for (std::size_t f = 0; f < sections[s].fields.size(); ++f) {
      const PropertyField& field = sections[s].fields[f];
      QWidget* widget = makeControl(s, f, field);
      widget->setObjectName(QString::fromStdString(field.keyPath));
      widget->setEnabled(!field.readOnly);
      form->addRow(QString::fromStdString(field.title), widget);
      controls_.push_back({s, f, widget});
    }
    bodyLayout->addWidget(group);
  }
  bodyLayout->addStretch(1);
  layout_->addWidget(body_);
  refreshValues();
  // Grows to show a longer sheet; never shrinks under the user's hand.
  resize(size().expandedTo(sizeHint()));
}

void PropertyPanel::refreshValues() {
  setWindowTitle(QString::fromStdString(controller_.title()));
  showing_ = true;
  for (const Control& control : controls_) {
    showValue(control);
  }
  showing_ = false;
}

QWidget* PropertyPanel::makeControl(std::size_t s, std::size_t f,
                                    const PropertyField& description) {
  const auto edit = [this, s, f](const Value& value) {
    if (!showing_) {
      controller_.setValueAt(s, f, value);
    }
  };
  switch (description.kind) {
    case PropertyKind::Number: {
      auto* box = new QDoubleSpinBox;
      box->setRange(description.minimum, description.maximum);
      box->setSingleStep(description.step);
      box->setDecimals(description.decimals);
      // One edit when the user presses Return or leaves the box, not one per
      // digit typed.
      box->setKeyboardTracking(false);
      connect(box, &QDoubleSpinBox::valueChanged, this, [edit](double v) { edit(v); });
      return box;
    }
    case PropertyKind::Integer: {
      auto* box = new QSpinBox;
      box->setRange(static_cast<int>(description.minimum), static_cast<int>(description.maximum));
      box->setKeyboardTracking(false);
      connect(box, &QSpinBox::valueChanged, this,
              [edit](int v) { edit(static_cast<std::int32_t>(v)); });
      return box;
    }
    case PropertyKind::Bool: {
      auto* box = new QCheckBox;
      connect(box, &QCheckBox::toggled, this, [edit](bool v) { edit(v); });
      return box;
    }
    case PropertyKind::Choice: {
      auto* box = new QComboBox;
      for (const auto& choice : description.choices) {
        box->addItem(QString::fromStdString(choice));
      }
      connect(box, &QComboBox::activated, this,
              [edit](int index) { edit(static_cast<std::int32_t>(index)); });
      return box;
    }
    case PropertyKind::Colour: {
      auto* button = new QPushButton;
      button->setFixedWidth(64);
      connect(button, &QPushButton::clicked, this, [this, s, f] { chooseColour(s, f); });
      return button;
    }
    case PropertyKind::Text: {
      auto* line = new QLineEdit;
      line->setReadOnly(description.readOnly);
      connect(line, &QLineEdit::editingFinished, this,
              [edit, line] { edit(line->text().toStdString()); });
      return line;
    }
  }
  return new QLabel;
}

void PropertyPanel::showValue(const Control& control) {
  const Value value = controller_.valueAt(control.section, control.field);
  if (auto* real = qobject_cast<QDoubleSpinBox*>(control.widget)) {
    real->setValue(numberAs<double>(value).value_or(0.0));
  } else if (auto* whole = qobject_cast<QSpinBox*>(control.widget)) {
    whole->setValue(numberAs<int>(value).value_or(0));
  } else if (auto* check = qobject_cast<QCheckBox*>(control.widget)) {
    check->setChecked(numberAs<bool>(value).value_or(false));
  } else if (auto* menu = qobject_cast<QComboBox*>(control.widget)) {
    // A value outside the choices (a primitive's shape 7) shows no choice.
    menu->setCurrentIndex(numberAs<int>(value).value_or(-1));
  } else if (auto* button = qobject_cast<QPushButton*>(control.widget)) {
    const auto colour = objectAs<Color>(value);
    const QColor shown = colour ? qColor(*colour) : QColor(Qt::black);
    button->setStyleSheet(QStringLiteral("background-color: %1").arg(shown.name()));
  } else if (auto* line = qobject_cast<QLineEdit*>(control.widget)) {
    if (!line->hasFocus() || line->isReadOnly()) {
      const auto* text = std::get_if<std::string>(&value);
      line->setText(text != nullptr ? QString::fromStdString(*text) : QString());
    }
  }
}

void PropertyPanel::chooseColour(std::size_t section, std::size_t field) {
  const auto current = objectAs<Color>(controller_.valueAt(section, field));
  const QColor chosen =
      QColorDialog::getColor(current ? qColor(*current) : QColor(Qt::white), this,
                             QStringLiteral("Colour"), QColorDialog::ShowAlphaChannel);
  if (!chosen.isValid()) {
    return;
  }
  controller_.setValueAt(
      section, field,
      ObjectPtr(Color::colorWithRGBA(
          static_cast<float>(chosen.redF()), static_cast<float>(chosen.greenF()),
          static_cast<float>(chosen.blueF()), static_cast<float>(chosen.alphaF()))));
}

}  // namespace cloudreel::app
