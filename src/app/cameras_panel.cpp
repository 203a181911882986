#include "app/cameras_panel.h"

#include <QHeaderView>
#include <QSignalBlocker>
#include <QTreeWidget>
#include <QVBoxLayout>

namespace cloudreel::app {

namespace {

constexpr int kGroupRole = Qt::UserRole;
constexpr int kRowRole = Qt::UserRole + 1;

QString qt(const std::string& text) { return QString::fromStdString(text); }

}  // namespace

CamerasPanel::CamerasPanel(std::shared_ptr<MyDocument> frontDocument, QWidget* parent)
    : QWidget(parent, Qt::Tool) {
  setWindowTitle(QStringLiteral("Cameras"));
  auto* layout = new QVBoxLayout(this);
  tree_ = new QTreeWidget;
  tree_->setColumnCount(2);
  tree_->setHeaderLabels({QStringLiteral("Camera"), QStringLiteral("Photograph")});
  tree_->header()->setSectionResizeMode(0, QHeaderView::ResizeToContents);
  layout->addWidget(tree_);
  resize(320, 420);
  connect(tree_, &QTreeWidget::currentItemChanged, this,
          [this](QTreeWidgetItem* item) { currentItemChanged(item); });
  controller_.setReloadHandler([this] { reload(); });
  controller_.setDocument(frontDocument);
}

QTreeWidgetItem* CamerasPanel::itemFor(CameraPanelController::Position position) const {
  QTreeWidgetItem* group = tree_->topLevelItem(static_cast<int>(position.group));
  return group != nullptr ? group->child(static_cast<int>(position.row)) : nullptr;
}

void CamerasPanel::reload() {
  const auto& groups = controller_.groups();
  QStringList titles;
  for (const auto& group : groups) {
    titles << qt(group.title) + QStringLiteral("/%1").arg(group.rows.size());
    for (const auto& row : group.rows) {
      titles << qt(row.title) << qt(row.detail);
    }
  }
  const QSignalBlocker blocker(tree_);
  if (titles != shownTitles_) {
    shownTitles_ = titles;
    tree_->clear();
    for (std::size_t g = 0; g < groups.size(); ++g) {
      auto* groupItem = new QTreeWidgetItem(tree_, {qt(groups[g].title)});
      groupItem->setFlags(Qt::ItemIsEnabled);
      for (std::size_t r = 0; r < groups[g].rows.size(); ++r) {
        const auto& row = groups[g].rows[r];
        auto* item = new QTreeWidgetItem(groupItem, {qt(row.title), qt(row.detail)});
        item->setData(0, kGroupRole, static_cast<qulonglong>(g));
        item->setData(0, kRowRole, static_cast<qulonglong>(r));
      }
    }
    tree_->expandAll();
  }
  const auto selected = controller_.selectedPosition();
  QTreeWidgetItem* current = selected ? itemFor(*selected) : nullptr;
  tree_->setCurrentItem(current);
  if (current == nullptr) {
    tree_->clearSelection();
  }
}

void CamerasPanel::currentItemChanged(QTreeWidgetItem* item) {
  if (item == nullptr || !item->data(0, kGroupRole).isValid()) {
    return;
  }
  controller_.selectCameraAt({static_cast<std::size_t>(item->data(0, kGroupRole).toULongLong()),
                              static_cast<std::size_t>(item->data(0, kRowRole).toULongLong())});
}

}  // namespace cloudreel::app
