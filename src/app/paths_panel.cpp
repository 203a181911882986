#include "app/paths_panel.h"

#include <QCheckBox>
#include <QDoubleSpinBox>
#include <QFormLayout>
#include <QGroupBox>
#include <QHBoxLayout>
#include <QListWidget>
#include <QPushButton>
#include <QVBoxLayout>
#include <functional>

namespace cloudreel::app {

namespace {

using MemberValue = CameraPathsPanelController::MemberValue;

// Rebuilds the list only when its lines changed, so that a choice made in
// the list (which reloads the panel) keeps its items.
void fill(QListWidget& list, const std::vector<CameraPathsPanelController::Row>& rows,
          std::optional<std::size_t> current) {
  QStringList lines;
  for (const auto& row : rows) {
    lines << QStringLiteral("%1  (%2, %3 frames)")
                 .arg(QString::fromStdString(row.title), QString::fromStdString(row.kind))
                 .arg(row.frames);
  }
  QStringList shown;
  for (int i = 0; i < list.count(); ++i) {
    shown << list.item(i)->text();
  }
  if (shown != lines) {
    list.clear();
    list.addItems(lines);
  }
  list.setCurrentRow(current ? static_cast<int>(*current) : -1);
}

std::optional<std::size_t> rowOf(const QListWidget& list) {
  const int row = list.currentRow();
  return row >= 0 ? std::optional<std::size_t>(static_cast<std::size_t>(row)) : std::nullopt;
}

QPushButton* addButton(QHBoxLayout* layout, const QString& title, std::function<void()> run) {
  auto* button = new QPushButton(title);
  layout->addWidget(button);
  QObject::connect(button, &QPushButton::clicked, button, [run = std::move(run)] { run(); });
  return button;
}

}  // namespace

PathsPanel::PathsPanel(std::shared_ptr<MyDocument> frontDocument, QWidget* parent)
    : QWidget(parent, Qt::Tool) {
  setWindowTitle(QStringLiteral("Camera Paths"));
  auto* layout = new QVBoxLayout(this);

  auto* pathBox = new QGroupBox(QStringLiteral("Camera Paths"));
  auto* pathLayout = new QVBoxLayout(pathBox);
  paths_ = new QListWidget;
  pathLayout->addWidget(paths_);
  auto* pathButtons = new QHBoxLayout;
  addButton(pathButtons, QStringLiteral("New Path"), [this] { controller_.addCameraPath(); });
  addButton(pathButtons, QStringLiteral("Add Selected Layer"),
            [this] { controller_.addSelectedLayerAsPath(); });
  addButton(pathButtons, QStringLiteral("Remove"), [this] { controller_.removeSelectedPath(); });
  pathLayout->addLayout(pathButtons);
  layout->addWidget(pathBox);

  auto* stackBox = new QGroupBox(QStringLiteral("Transform Stacks"));
  auto* stackLayout = new QVBoxLayout(stackBox);
  stacks_ = new QListWidget;
  stackLayout->addWidget(stacks_);
  auto* stackButtons = new QHBoxLayout;
  addButton(stackButtons, QStringLiteral("New Stack"), [this] { controller_.addTransformStack(); });
  addButton(stackButtons, QStringLiteral("Remove"), [this] { controller_.removeSelectedStack(); });
  stackLayout->addLayout(stackButtons);

  members_ = new QListWidget;
  stackLayout->addWidget(members_);
  auto* memberButtons = new QHBoxLayout;
  addButton(memberButtons, QStringLiteral("Add Path"),
            [this] { controller_.addSelectedPathToStack(); });
  addButton(memberButtons, QStringLiteral("Remove"), [this] {
    if (const auto row = currentMember()) {
      controller_.removeMember(*row);
    }
  });
  addButton(memberButtons, QStringLiteral("Up"), [this] {
    const auto row = currentMember();
    if (row && controller_.moveMemberUp(*row)) {
      members_->setCurrentRow(static_cast<int>(*row) - 1);
    }
  });
  addButton(memberButtons, QStringLiteral("Down"), [this] {
    const auto row = currentMember();
    if (row && controller_.moveMemberDown(*row)) {
      members_->setCurrentRow(static_cast<int>(*row) + 1);
    }
  });
  stackLayout->addLayout(memberButtons);

  memberEditor_ = new QWidget;
  auto* form = new QFormLayout(memberEditor_);
  gain_ = new QDoubleSpinBox;
  gain_->setRange(-1000.0, 1000.0);
  gain_->setDecimals(3);
  gain_->setSingleStep(0.1);
  form->addRow(QStringLiteral("Translation gain:"), gain_);
  enableRotation_ = new QCheckBox(QStringLiteral("Rotation"));
  enableTranslation_ = new QCheckBox(QStringLiteral("Translation"));
  invertRotation_ = new QCheckBox(QStringLiteral("Invert rotation"));
  invertTranslation_ = new QCheckBox(QStringLiteral("Invert translation"));
  form->addRow(enableRotation_);
  form->addRow(enableTranslation_);
  form->addRow(invertRotation_);
  form->addRow(invertTranslation_);
  stackLayout->addWidget(memberEditor_);
  layout->addWidget(stackBox);

  connect(paths_, &QListWidget::currentRowChanged, this, [this] {
    if (!reloading_) {
      controller_.selectPath(rowOf(*paths_));
    }
  });
  connect(stacks_, &QListWidget::currentRowChanged, this, [this] {
    if (!reloading_) {
      controller_.selectStack(rowOf(*stacks_));
    }
  });
  connect(members_, &QListWidget::currentRowChanged, this, [this] { showMember(); });
  connect(gain_, &QDoubleSpinBox::valueChanged, this, [this](double v) {
    setMemberValue(MemberValue::TranslationGain, static_cast<float>(v));
  });
  const std::pair<QCheckBox*, MemberValue> switches[] = {
      {enableRotation_, MemberValue::EnableRotation},
      {enableTranslation_, MemberValue::EnableTranslation},
      {invertRotation_, MemberValue::InvertRotation},
      {invertTranslation_, MemberValue::InvertTranslation}};
  for (const auto& [box, which] : switches) {
    connect(box, &QCheckBox::toggled, this,
            [this, which = which](bool on) { setMemberValue(which, on); });
  }

  resize(360, 640);
  controller_.setReloadHandler([this] { reload(); });
  controller_.setDocument(frontDocument);
  reload();
}

std::optional<std::size_t> PathsPanel::currentMember() const { return rowOf(*members_); }

void PathsPanel::setMemberValue(MemberValue which, const Value& value) {
  if (reloading_) {
    return;
  }
  if (const auto row = currentMember()) {
    controller_.setMemberValue(*row, which, value);
  }
}

void PathsPanel::reload() {
  reloading_ = true;
  const int member = members_->currentRow();
  fill(*paths_, controller_.pathRows(), controller_.selectedPath());
  fill(*stacks_, controller_.stackRows(), controller_.selectedStack());
  const auto rows = controller_.memberRows();
  const bool keep = member >= 0 && static_cast<std::size_t>(member) < rows.size();
  fill(*members_, rows,
       keep ? std::optional<std::size_t>(static_cast<std::size_t>(member)) : std::nullopt);
  reloading_ = false;
  showMember();
}

void PathsPanel::showMember() {
  const auto row = currentMember();
  memberEditor_->setEnabled(row.has_value());
  if (!row) {
    return;
  }
  reloading_ = true;
  const auto asBool = [](const Value& v) {
    return std::holds_alternative<bool>(v) && std::get<bool>(v);
  };
  const auto gain = numberAs<double>(controller_.memberValue(*row, MemberValue::TranslationGain));
  gain_->setValue(gain.value_or(0.0));
  enableRotation_->setChecked(asBool(controller_.memberValue(*row, MemberValue::EnableRotation)));
  enableTranslation_->setChecked(
      asBool(controller_.memberValue(*row, MemberValue::EnableTranslation)));
  invertRotation_->setChecked(asBool(controller_.memberValue(*row, MemberValue::InvertRotation)));
  invertTranslation_->setChecked(
      asBool(controller_.memberValue(*row, MemberValue::InvertTranslation)));
  reloading_ = false;
}

}  // namespace cloudreel::app
