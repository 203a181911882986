#pragma once
// The layers panel's model: the document's layer tree as its outline data
// source answers it, two columns identified by layer property keys ("name"
// and "isVisible"), both editable through the data source so that an edit
// is an undo step. The tree is read again when the document reloads its
// outline or reports a change.

#include <QAbstractItemModel>
#include <memory>
#include <vector>

#include "scene/my_document.h"

namespace cloudreel::app {

class LayerOutlineModel : public QAbstractItemModel, public LayerOutline {
  Q_OBJECT
 public:
  // The document must outlive the model; the model is its outline view
  // while it lives.
  explicit LayerOutlineModel(MyDocument& document, QObject* parent = nullptr);
  ~LayerOutlineModel() override;

  static constexpr int kNameColumn = 0;
  static constexpr int kVisibleColumn = 1;

  // A new reading of the tree; the views' expansion and selection survive
  // when only names and visibility changed.
  void reloadData() override;

  QModelIndex indexForLayer(const Layer* layer) const;
  std::shared_ptr<Layer> layerAtIndex(const QModelIndex& index) const;

  QModelIndex index(int row, int column, const QModelIndex& parent) const override;
  QModelIndex parent(const QModelIndex& child) const override;
  int rowCount(const QModelIndex& parent) const override;
  int columnCount(const QModelIndex& parent) const override;
  QVariant data(const QModelIndex& index, int role) const override;
  bool setData(const QModelIndex& index, const QVariant& value, int role) override;
  Qt::ItemFlags flags(const QModelIndex& index) const override;
  QVariant headerData(int section, Qt::Orientation orientation, int role) const override;

 private:
  struct Node {
    std::weak_ptr<Layer> layer;
    const Layer* key = nullptr;
    Node* parent = nullptr;
    int row = 0;
    std::vector<std::unique_ptr<Node>> children;
  };

  std::unique_ptr<Node> readTree() const;
  void readChildren(Node& node, int depth) const;
  static bool sameShape(const Node& a, const Node& b);
  Node* nodeAt(const QModelIndex& index) const;
  void emitDataChanged(const Node& node);

  MyDocument& document_;
  std::unique_ptr<Node> root_;
};

}  // namespace cloudreel::app
