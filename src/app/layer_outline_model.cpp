#include "app/layer_outline_model.h"

#include "scene/layer.h"

namespace cloudreel::app {

namespace {

constexpr const char* kColumnKeys[] = {"name", "isVisible"};
// A tree made into a loop (a layer below itself) is read this deep and no
// deeper, so reading always ends.
constexpr int kMaximumDepth = 64;

}  // namespace

LayerOutlineModel::LayerOutlineModel(MyDocument& document, QObject* parent)
    : QAbstractItemModel(parent), document_(document), root_(readTree()) {
  document_.setOutlineView(this);
}

LayerOutlineModel::~LayerOutlineModel() { document_.setOutlineView(nullptr); }

std::unique_ptr<LayerOutlineModel::Node> LayerOutlineModel::readTree() const {
  auto root = std::make_unique<Node>();
  readChildren(*root, 0);
  return root;
}

void LayerOutlineModel::readChildren(Node& node, int depth) const {
  if (depth >= kMaximumDepth) {
    return;
  }
  const Layer* item = node.key;
  if (item != nullptr && !document_.outlineViewIsItemExpandable(item)) {
    return;
  }
  const int count = document_.outlineViewNumberOfChildrenOfItem(item);
  for (int i = 0; i < count; ++i) {
    auto child = std::make_unique<Node>();
    const std::shared_ptr<Layer> layer = document_.outlineViewChildOfItem(i, item);
    child->layer = layer;
    child->key = layer.get();
    child->parent = &node;
    child->row = i;
    readChildren(*child, depth + 1);
    node.children.push_back(std::move(child));
  }
}

bool LayerOutlineModel::sameShape(const Node& a, const Node& b) {
  if (a.key != b.key || a.children.size() != b.children.size()) {
    return false;
  }
  for (std::size_t i = 0; i < a.children.size(); ++i) {
    if (!sameShape(*a.children[i], *b.children[i])) {
      return false;
    }
  }
  return true;
}

void LayerOutlineModel::reloadData() {
  auto fresh = readTree();
  if (sameShape(*fresh, *root_)) {
    emitDataChanged(*root_);
    return;
  }
  beginResetModel();
  root_ = std::move(fresh);
  endResetModel();
}

void LayerOutlineModel::emitDataChanged(const Node& node) {
  if (!node.children.empty()) {
    const Node& first = *node.children.front();
    const Node& last = *node.children.back();
    emit dataChanged(createIndex(first.row, kNameColumn, &first),
                     createIndex(last.row, kVisibleColumn, &last));
  }
  for (const auto& child : node.children) {
    emitDataChanged(*child);
  }
}

LayerOutlineModel::Node* LayerOutlineModel::nodeAt(const QModelIndex& index) const {
  return index.isValid() ? static_cast<Node*>(index.internalPointer()) : root_.get();
}

QModelIndex LayerOutlineModel::indexForLayer(const Layer* layer) const {
  if (layer == nullptr) {
    return {};
  }
  std::vector<const Node*> pending{root_.get()};
  while (!pending.empty()) {
    const Node* node = pending.back();
    pending.pop_back();
    for (const auto& child : node->children) {
      if (child->key == layer) {
        return createIndex(child->row, kNameColumn, child.get());
      }
      pending.push_back(child.get());
    }
  }
  return {};
}

std::shared_ptr<Layer> LayerOutlineModel::layerAtIndex(const QModelIndex& index) const {
  return index.isValid() ? nodeAt(index)->layer.lock() : nullptr;
}

QModelIndex LayerOutlineModel::index(int row, int column, const QModelIndex& parent) const {
  const Node* node = nodeAt(parent);
  if (row < 0 || row >= static_cast<int>(node->children.size()) || column < 0 || column > 1) {
    return {};
  }
  return createIndex(row, column, node->children[static_cast<std::size_t>(row)].get());
}

QModelIndex LayerOutlineModel::parent(const QModelIndex& child) const {
  const Node* node = nodeAt(child);
  if (!child.isValid() || node->parent == root_.get()) {
    return {};
  }
  return createIndex(node->parent->row, kNameColumn, node->parent);
}

int LayerOutlineModel::rowCount(const QModelIndex& parent) const {
  if (parent.column() > 0) {
    return 0;
  }
  return static_cast<int>(nodeAt(parent)->children.size());
}

int LayerOutlineModel::columnCount(const QModelIndex&) const { return 2; }

QVariant LayerOutlineModel::data(const QModelIndex& index, int role) const {
  const std::shared_ptr<Layer> layer = layerAtIndex(index);
  if (!layer) {
    return {};
  }
  const Value value =
      document_.outlineViewObjectValueForTableColumnByItem(kColumnKeys[index.column()], layer.get());
  if (index.column() == kNameColumn && (role == Qt::DisplayRole || role == Qt::EditRole)) {
    const auto* name = std::get_if<std::string>(&value);
    return name != nullptr ? QString::fromStdString(*name) : QString();
  }
  if (index.column() == kVisibleColumn && role == Qt::CheckStateRole) {
    return numberAs<bool>(value).value_or(false) ? Qt::Checked : Qt::Unchecked;
  }
  return {};
}

bool LayerOutlineModel::setData(const QModelIndex& index, const QVariant& value, int role) {
  const std::shared_ptr<Layer> layer = layerAtIndex(index);
  if (!layer) {
    return false;
  }
  if (index.column() == kNameColumn && role == Qt::EditRole) {
    document_.outlineViewSetObjectValueForTableColumnByItem(
        Value(value.toString().toStdString()), kColumnKeys[kNameColumn], layer.get());
  } else if (index.column() == kVisibleColumn && role == Qt::CheckStateRole) {
    const bool visible = value.toInt() == Qt::Checked;
    document_.outlineViewSetObjectValueForTableColumnByItem(Value(visible),
                                                            kColumnKeys[kVisibleColumn], layer.get());
  } else {
    return false;
  }
  emit dataChanged(index, index);
  return true;
}

Qt::ItemFlags LayerOutlineModel::flags(const QModelIndex& index) const {
  if (!index.isValid()) {
    return Qt::NoItemFlags;
  }
  Qt::ItemFlags flags = Qt::ItemIsEnabled | Qt::ItemIsSelectable;
  flags |= index.column() == kNameColumn ? Qt::ItemIsEditable : Qt::ItemIsUserCheckable;
  return flags;
}

QVariant LayerOutlineModel::headerData(int section, Qt::Orientation orientation, int role) const {
  if (orientation != Qt::Horizontal || role != Qt::DisplayRole) {
    return {};
  }
  return section == kNameColumn ? QStringLiteral("Name") : QStringLiteral("Visible");
}

}  // namespace cloudreel::app
