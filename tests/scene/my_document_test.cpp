#include "scene/my_document.h"

#include <gtest/gtest.h>

#include "camera/scene_camera.h"
#include "scene/layer.h"
#include "scene/light_source.h"

namespace cloudreel {
namespace {

std::shared_ptr<Layer> namedLayer(std::string name) {
  auto layer = std::make_shared<Layer>();
  layer->setName(std::move(name));
  return layer;
}

std::vector<std::string> namesOf(const std::vector<std::shared_ptr<Layer>>& layers) {
  std::vector<std::string> names;
  for (const auto& layer : layers) {
    names.push_back(layer->name());
  }
  return names;
}

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

TEST(MyDocument, ANewDocumentHasItsSceneCameraAndLight) {
  MyDocument document;
  EXPECT_TRUE(document.layers().empty());
  ASSERT_TRUE(document.sceneCamera());
  EXPECT_EQ(document.sceneCamera()->name(), "Scene Camera");
  EXPECT_EQ(document.sceneCamera()->positionZ(), 15.0f);
  ASSERT_TRUE(document.lightSource());
  EXPECT_EQ(document.lightSource()->objectToWorld()->translationY(), 10.0f);
  EXPECT_TRUE(document.enableViewUpdates());
}

TEST(MyDocument, AddingALayerUndoesAndRedoesAtTheSameIndex) {
  MyDocument document;
  document.addLayer(namedLayer("A"));
  document.addLayer(namedLayer("C"));
  const auto b = namedLayer("B");
  document.undoManager().closeEventGroup();
  document.insertObjectInLayersAtIndex(b, 1);
  document.undoManager().closeEventGroup();
  EXPECT_EQ(namesOf(document.layers()), (std::vector<std::string>{"A", "B", "C"}));
  EXPECT_EQ(b->document(), &document);
  EXPECT_EQ(document.undoManager().undoActionName(), "New Layer");

  document.undoManager().undo();
  EXPECT_EQ(namesOf(document.layers()), (std::vector<std::string>{"A", "C"}));
  EXPECT_EQ(b->document(), nullptr);
  EXPECT_EQ(document.undoManager().redoActionName(), "New Layer");

  document.undoManager().redo();
  EXPECT_EQ(namesOf(document.layers()), (std::vector<std::string>{"A", "B", "C"}));
  EXPECT_EQ(b->document(), &document);
  // An attached layer's edits are undoable again.
  b->setName("Bee");
  document.undoManager().closeEventGroup();
  EXPECT_EQ(document.undoManager().undoActionName(), "Change Name");
}

TEST(MyDocument, RemovingALayerDetachesItAndUndoPutsItBack) {
  MyDocument document;
  const auto a = namedLayer("A");
  document.addLayer(a);
  document.addLayer(namedLayer("B"));
  document.undoManager().closeEventGroup();
  document.removeObjectFromLayersAtIndex(0);
  document.undoManager().closeEventGroup();
  EXPECT_EQ(a->document(), nullptr);
  EXPECT_EQ(document.undoManager().undoActionName(), "Remove Layer");
  // A detached layer's edits are not the document's to undo.
  a->setName("Gone");
  document.undoManager().closeEventGroup();
  EXPECT_EQ(document.undoManager().undoActionName(), "Remove Layer");

  document.undoManager().undo();
  EXPECT_EQ(namesOf(document.layers()), (std::vector<std::string>{"Gone", "B"}));
  EXPECT_EQ(a->document(), &document);
}

TEST(MyDocument, IndexesOutsideTheListChangeNothing) {
  MyDocument document;
  document.addLayer(namedLayer("A"));
  document.undoManager().closeEventGroup();
  document.undoManager().removeAllActions();
  const auto stray = namedLayer("Stray");
  for (const int index : {-1, 2, 1000}) {
    document.insertObjectInLayersAtIndex(stray, index);
    document.removeObjectFromLayersAtIndex(index);
  }
  document.removeObjectFromLayersAtIndex(1);
  EXPECT_EQ(namesOf(document.layers()), (std::vector<std::string>{"A"}));
  EXPECT_EQ(stray->document(), nullptr);
  EXPECT_FALSE(document.undoManager().canUndo());
}

TEST(MyDocument, LayerPropertyEditsBecomeNamedUndoSteps) {
  MyDocument document;
  const auto layer = namedLayer("Points");
  document.addLayer(layer);
  document.undoManager().closeEventGroup();

  layer->setIsVisible(false);
  document.undoManager().closeEventGroup();
  EXPECT_EQ(document.undoManager().undoActionName(), "Layer Visibility");
  // The outline sets values by the column's key, and that too is undoable.
  document.outlineViewSetObjectValueForTableColumnByItem(std::string("Renamed"), "name",
                                                         layer.get());
  document.undoManager().closeEventGroup();
  EXPECT_EQ(document.undoManager().undoActionName(), "Change Name");

  document.undoManager().undo();
  EXPECT_EQ(layer->name(), "Points");
  document.undoManager().undo();
  EXPECT_TRUE(layer->isVisible());
  document.undoManager().redo();
  EXPECT_FALSE(layer->isVisible());
  EXPECT_EQ(document.undoManager().redoActionName(), "Change Name");
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
