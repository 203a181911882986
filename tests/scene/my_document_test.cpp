#include "scene/my_document.h"

#include <gtest/gtest.h>

#include "camera/discrete_camera_path.h"
#include "camera/slerp_camera_path.h"
#include "camera/transform_stack.h"
#include "camera/zxy_camera_path.h"
#include "scene/layer.h"

namespace cloudreel {
namespace {

template <class T = Layer>
std::shared_ptr<T> namedLayer(std::string name) {
  auto layer = std::make_shared<T>();
  layer->setName(std::move(name));
  return layer;
}

template <class T>
std::vector<std::string> namesOf(const std::vector<std::shared_ptr<T>>& layers) {
  std::vector<std::string> names;
  for (const auto& layer : layers) {
    names.push_back(layer->name());
  }
  return names;
}

using Names = std::vector<std::string>;

// Counts the notifications of a name from one sender.
struct NotificationCount : Observer {
  int count = 0;
  NotificationCount(std::string_view name, const void* sender) {
    NotificationCenter::defaultCenter().addObserver(*this, std::string(name), sender,
                                                    [this](const Notification&) { ++count; });
  }
  ~NotificationCount() override { NotificationCenter::defaultCenter().removeObserver(*this); }
};

struct CountingView : DocumentView {
  int redraws = 0;
  void setNeedsDisplay() override { ++redraws; }
};

struct CountingOutline : LayerOutline {
  int reloads = 0;
  void reloadData() override { ++reloads; }
};

// The document's two undoable lists. A layer is attached to the document
// while it is in the list and the outline reloads with each change; a
// stored camera path is neither attached nor shown in the outline.
struct Collection {
  std::string what;  // as the action names say it
  std::string key;   // announced by the add operation
  void (*add)(MyDocument&, std::shared_ptr<CameraPath>);
  void (*insert)(MyDocument&, std::shared_ptr<CameraPath>, int);
  void (*remove)(MyDocument&, int);
  Names (*names)(const MyDocument&);
  bool attaches;
};

TEST(MyDocument, ListEditsUndoAndRedoAtTheSameIndexUnderTheirNames) {
  const Collection collections[] = {
      {"Layer", "layers", [](MyDocument& d, std::shared_ptr<CameraPath> p) { d.addLayer(p); },
       [](MyDocument& d, std::shared_ptr<CameraPath> p, int i) {
         d.insertObjectInLayersAtIndex(p, i);
       },
       [](MyDocument& d, int i) { d.removeObjectFromLayersAtIndex(i); },
       [](const MyDocument& d) { return namesOf(d.layers()); }, true},
      {"Camera Path", "cameraPaths",
       [](MyDocument& d, std::shared_ptr<CameraPath> p) { d.addCameraPath(p); },
       [](MyDocument& d, std::shared_ptr<CameraPath> p, int i) {
         d.insertObjectInCameraPathsAtIndex(p, i);
       },
       [](MyDocument& d, int i) { d.removeObjectFromCameraPathsAtIndex(i); },
       [](const MyDocument& d) { return namesOf(d.storedCameraPaths()); }, false},
  };
  for (const Collection& c : collections) {
    SCOPED_TRACE(c.what);
    MyDocument document;
    CountingOutline outline;
    document.setOutlineView(&outline);
    int announced = 0;
    CallbackObserver observer([&](const auto&...) { ++announced; });
    document.addObserver(observer, c.key, ObservingOptions::None, "");
    UndoManager& undo = document.undoManager();
    const auto a = namedLayer<SLERPCameraPath>("A");
    const auto b = namedLayer<SLERPCameraPath>("B");
    c.add(document, a);
    c.add(document, namedLayer<SLERPCameraPath>("C"));
    undo.closeEventGroup();
    EXPECT_EQ(announced, 2);
    NotificationCount changes(kDocumentChangeNotification, &document);
    c.insert(document, b, 1);
    undo.closeEventGroup();
    EXPECT_EQ(c.names(document), (Names{"A", "B", "C"}));
    EXPECT_EQ(b->document(), c.attaches ? &document : nullptr);
    EXPECT_EQ(undo.undoActionName(), "New " + c.what);
    undo.undo();
    EXPECT_EQ(c.names(document), (Names{"A", "C"}));
    EXPECT_EQ(b->document(), nullptr);
    EXPECT_EQ(undo.redoActionName(), "New " + c.what);
    undo.redo();
    EXPECT_EQ(c.names(document), (Names{"A", "B", "C"}));
    EXPECT_EQ(b->document(), c.attaches ? &document : nullptr);

    c.remove(document, 0);
    undo.closeEventGroup();
    EXPECT_EQ(c.names(document), (Names{"B", "C"}));
    EXPECT_EQ(a->document(), nullptr);
    EXPECT_EQ(undo.undoActionName(), "Remove " + c.what);
    // A layer out of the document is not the document's to undo; put back,
    // it is again.
    a->setName("Gone");
    undo.closeEventGroup();
    EXPECT_EQ(undo.undoActionName(), "Remove " + c.what);
    undo.undo();
    EXPECT_EQ(c.names(document), (Names{"Gone", "B", "C"}));
    EXPECT_EQ(undo.redoActionName(), "Remove " + c.what);
    a->setName("A");
    undo.closeEventGroup();
    EXPECT_EQ(undo.undoActionName(), c.attaches ? "Change Name" : "New " + c.what);
    // Each edit, its undo and its redo reported a change.
    EXPECT_EQ(changes.count, 5);
    EXPECT_EQ(outline.reloads, c.attaches ? 7 : 0);

    // Indexes outside the list and a null object change nothing and leave
    // no step to undo.
    undo.removeAllActions();
    const auto stray = namedLayer<SLERPCameraPath>("Stray");
    for (const int index : {-1, 4, 1000}) {
      c.insert(document, stray, index);
      c.remove(document, index);
    }
    c.remove(document, 3);
    c.insert(document, nullptr, 0);
    EXPECT_EQ(c.names(document), (Names{"A", "B", "C"}));
    EXPECT_EQ(stray->document(), nullptr);
    EXPECT_FALSE(undo.canUndo());
    document.removeObserver(observer, c.key);
  }
}

TEST(MyDocument, CameraPathsAreGatheredFromTheTreeAndDiscretePathsFromTheTopOnly) {
  MyDocument document;
  // Group > (SLERP > ZXY, Inner > Discrete); then top-level Discrete, ZXY
  // (a kind of discrete path) and a transform stack.
  const auto group = namedLayer("Group");
  const auto slerp = namedLayer<SLERPCameraPath>("S");
  const auto inner = namedLayer("Inner");
  const auto nestedDiscrete = namedLayer<DiscreteCameraPath>("nested D");
  slerp->addChildLayer(namedLayer<ZXYCameraPath>("nested Z"));
  inner->addChildLayer(nestedDiscrete);
  group->addChildLayer(slerp);
  group->addChildLayer(inner);
  document.addLayer(group);
  document.addLayer(namedLayer<DiscreteCameraPath>("D"));
  document.addLayer(namedLayer<ZXYCameraPath>("Z"));
  document.addLayer(namedLayer<TransformStack>("T"));
  document.addCameraPath(namedLayer<SLERPCameraPath>("stored"));
  const Names gathered = {"S", "nested Z", "nested D", "D", "Z", "T"};
  EXPECT_EQ(namesOf(document.cameraPaths()), gathered);
  EXPECT_EQ(namesOf(document.discretePaths()), (Names{"D"}));
  EXPECT_EQ(namesOf(document.storedCameraPaths()), (Names{"stored"}));

  // A tree looped back on itself ends the walk rather than the program.
  inner->addChildLayer(group);
  EXPECT_EQ(namesOf(document.cameraPaths()), gathered);
  std::vector<std::shared_ptr<CameraPath>> paths;
  MyDocument::addCameraPathsForLayer(inner, paths);
  EXPECT_EQ(namesOf(paths), (Names{"nested D", "S", "nested Z"}));
  inner->setChildLayers({nestedDiscrete});
}

TEST(MyDocument, LayerPropertyEditsBecomeNamedUndoSteps) {
  MyDocument document;
  UndoManager& undo = document.undoManager();
  const auto layer = namedLayer("Points");
  document.addLayer(layer);
  undo.closeEventGroup();

  layer->setIsVisible(false);
  undo.closeEventGroup();
  EXPECT_EQ(undo.undoActionName(), "Layer Visibility");
  // The outline sets values by the column's key, and that too is undoable.
  document.outlineViewSetObjectValueForTableColumnByItem(std::string("Renamed"), "name",
                                                         layer.get());
  undo.closeEventGroup();
  EXPECT_EQ(undo.undoActionName(), "Change Name");
  undo.undo();
  EXPECT_EQ(layer->name(), "Points");
  undo.undo();
  EXPECT_TRUE(layer->isVisible());
}

TEST(MyDocument, ChangesRedrawTheViewsUnlessUpdatesAreOffAndAlwaysNotify) {
  MyDocument document;
  CountingView first, second, playback;
  document.addView(first);
  document.addView(second);
  NotificationCount changes(kDocumentChangeNotification, &document);

  document.hasChanged();
  EXPECT_EQ(first.redraws, 1);
  EXPECT_EQ(second.redraws, 1);

  document.setPlaybackView(&playback);
  document.hasChanged();
  EXPECT_EQ(first.redraws, 1);
  EXPECT_EQ(playback.redraws, 1);

  document.setPlaybackView(nullptr);
  document.setEnableViewUpdates(false);
  document.hasChanged();
  EXPECT_EQ(first.redraws, 1);
  EXPECT_EQ(changes.count, 3);

  // A preference colour change redraws every document.
  document.setEnableViewUpdates(true);
  NotificationCenter::defaultCenter().postNotificationName(
      std::string(kGridColorChangedNotification), nullptr);
  EXPECT_EQ(first.redraws, 2);
  EXPECT_EQ(changes.count, 4);
}

TEST(MyDocument, SelectionTellsTheOldLayerAndTheNew) {
  MyDocument document;
  const auto a = namedLayer("A");
  const auto b = namedLayer("B");
  document.addLayer(a);
  document.addLayer(b);  // adding selects
  EXPECT_EQ(document.selectedLayer(), b);

  NotificationCount aDeselected(kLayerDeactivateNotification, a.get());
  NotificationCount bDeselected(kLayerDeactivateNotification, b.get());
  NotificationCount aSelected(kLayerActivateNotification, a.get());
  document.setSelectedLayer(a);
  EXPECT_EQ(bDeselected.count, 1);
  EXPECT_EQ(aSelected.count, 1);
  document.setSelectedLayer(nullptr);
  EXPECT_EQ(aDeselected.count, 1);
  EXPECT_EQ(document.selectedLayer(), nullptr);

  // The selection does not keep a layer alive.
  auto temporary = namedLayer("T");
  document.setSelectedLayer(temporary);
  temporary.reset();
  EXPECT_EQ(document.selectedLayer(), nullptr);
}

TEST(MyDocument, OutlineAnswersTheTreeAndTruncatesExpandability) {
  MyDocument document;
  const auto parent = namedLayer("Parent");
  document.addLayer(parent);
  for (int i = 0; i < 256; ++i) {
    parent->addChildLayer(namedLayer("child " + std::to_string(i)));
  }
  EXPECT_EQ(document.outlineViewNumberOfChildrenOfItem(nullptr), 1);
  EXPECT_TRUE(document.outlineViewIsItemExpandable(nullptr));
  EXPECT_EQ(document.outlineViewChildOfItem(0, nullptr), parent);
  EXPECT_EQ(document.outlineViewNumberOfChildrenOfItem(parent.get()), 256);
  // Exactly 256 children: the low eight bits of the count are zero.
  EXPECT_FALSE(document.outlineViewIsItemExpandable(parent.get()));
  parent->addChildLayer(namedLayer("one more"));
  EXPECT_TRUE(document.outlineViewIsItemExpandable(parent.get()));
  EXPECT_EQ(document.outlineViewChildOfItem(3, parent.get())->name(), "child 3");
  EXPECT_EQ(document.outlineViewChildOfItem(257, parent.get()), nullptr);
  EXPECT_EQ(document.outlineViewChildOfItem(-1, nullptr), nullptr);
  EXPECT_EQ(document.outlineViewObjectValueForTableColumnByItem("name", parent.get()),
            Value(std::string("Parent")));
}

TEST(MyDocument, ClosingDetachesEveryLayer) {
  const auto layer = namedLayer("Survivor");
  {
    MyDocument document;
    document.addLayer(layer);
    EXPECT_EQ(layer->document(), &document);
  }
  EXPECT_EQ(layer->document(), nullptr);
  layer->setName("Still fine");  // no observer left behind
  layer->setValueForKeyPath(2.0, "objectToWorld.scale");
}

}  // namespace
}  // namespace cloudreel
