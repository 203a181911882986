#include "platform/undo_manager.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/run_loop.h"

namespace cloudreel {
namespace {

// A value whose every set registers setting the old value back, as the
// document's property observers do, so that undoing a set registers its redo.
struct UndoableValue {
  UndoManager& undo;
  int value = 0;
  void set(int v, const std::string& actionName) {
    undo.registerUndoWithTarget(this, [this, old = value, actionName] { set(old, actionName); });
    undo.setActionName(actionName);
    value = v;
  }
};

TEST(UndoManager, StepsUndoAndRedoWithTheirActionNamesUntilANewEditClearsTheRedos) {
  UndoManager undo;
  UndoableValue scale{undo}, name{undo};
  scale.set(2, "Scale");
  undo.closeEventGroup();
  name.set(5, "Change Name");
  undo.closeEventGroup();
  EXPECT_EQ(undo.undoActionName(), "Change Name");

  undo.undo();
  EXPECT_EQ(name.value, 0);
  EXPECT_EQ(undo.undoActionName(), "Scale");
  EXPECT_EQ(undo.redoActionName(), "Change Name");
  undo.undo();
  EXPECT_EQ(scale.value, 0);
  EXPECT_FALSE(undo.canUndo());
  EXPECT_EQ(undo.redoActionName(), "Scale");

  undo.redo();
  EXPECT_EQ(scale.value, 2);
  EXPECT_EQ(undo.undoActionName(), "Scale");
  undo.redo();
  EXPECT_EQ(name.value, 5);
  EXPECT_FALSE(undo.canRedo());

  // The round trip can go on: undoing again still works from the redone state.
  undo.undo();
  undo.undo();
  EXPECT_EQ(scale.value, 0);
  EXPECT_EQ(name.value, 0);

  // A fresh edit clears what could have been redone.
  scale.set(3, "Scale");
  EXPECT_FALSE(undo.canRedo());
}

TEST(UndoManager, GroupsOneEventIntoOneStepUndoneInReverseOrder) {
  RunLoop loop;
  UndoManager undo(&loop);
  std::vector<int> order;
  int target = 0;
  undo.registerUndoWithTarget(&target, [&] { order.push_back(1); });
  undo.registerUndoWithTarget(&target, [&] { order.push_back(2); });
  undo.setActionName("Move");
  loop.runPending();  // the end of the event closes the group
  undo.registerUndoWithTarget(&target, [&] { order.push_back(3); });
  loop.runPending();

  undo.undo();
  EXPECT_EQ(order, std::vector<int>({3}));
  EXPECT_EQ(undo.undoActionName(), "Move");
  undo.undo();
  EXPECT_EQ(order, std::vector<int>({3, 2, 1}));
}

TEST(UndoManager, ExplicitGroupsNestAndDisabledRegistrationIsIgnored) {
  UndoManager undo;
  undo.setGroupsByEvent(false);
  int value = 0;
  bool undoing = false;
  undo.beginUndoGrouping();
  undo.registerUndoWithTarget(&value, [&] { value -= 1; });
  undo.beginUndoGrouping();
  undo.registerUndoWithTarget(&value, [&] {
    value -= 10;
    undoing = undo.isUndoing();
  });
  undo.setActionName("Inner");
  undo.endUndoGrouping();
  undo.endUndoGrouping();
  undo.disableUndoRegistration();
  undo.registerUndoWithTarget(&value, [&] { value -= 100; });
  undo.enableUndoRegistration();
  value = 11;
  EXPECT_EQ(undo.undoActionName(), "Inner");
  EXPECT_FALSE(undo.isUndoing());
  undo.undo();
  EXPECT_EQ(value, 0);
  EXPECT_TRUE(undoing);  // only while undoing
  EXPECT_FALSE(undo.isUndoing());
  EXPECT_FALSE(undo.canUndo());
}

TEST(UndoManager, RemovingATargetForgetsOnlyItsActions) {
  UndoManager undo;
  int a = 0;
  int b = 0;
  undo.registerUndoWithTarget(&a, [&] { a = 1; });
  undo.closeEventGroup();
  undo.registerUndoWithTarget(&b, [&] { b = 1; });
  undo.registerUndoWithTarget(&a, [&] { a = 2; });
  undo.closeEventGroup();
  undo.removeAllActionsWithTarget(&a);
  undo.undo();
  EXPECT_EQ(b, 1);
  EXPECT_EQ(a, 0);
  EXPECT_FALSE(undo.canUndo());  // the first step held only actions of a
}

TEST(UndoManager, APostedCloseOutlivingItsManagerIsHarmless) {
  RunLoop loop;
  {
    UndoManager undo(&loop);
    undo.registerUndoWithTarget(nullptr, [] {});
  }
  EXPECT_TRUE(loop.runPending());
}

// A step is reported once, at its first registration; its redo (built
// while undoing) and registrations while disabled are not new steps.
TEST(UndoManager, ReportsEachNewStepUndoRedoAndClearOnce) {
  UndoManager undo;
  std::vector<UndoManager::Change> changes;
  undo.setChangeHandler([&](UndoManager::Change c) { changes.push_back(c); });
  UndoableValue a{undo};
  a.set(1, "One");
  a.set(2, "One");  // same event group
  undo.closeEventGroup();
  undo.disableUndoRegistration();
  a.set(3, "Off");
  undo.enableUndoRegistration();
  undo.undo();
  undo.redo();
  undo.removeAllActions();
  using C = UndoManager::Change;
  EXPECT_EQ(changes, (std::vector<C>{C::Done, C::Undone, C::Redone, C::Cleared}));
}

}  // namespace
}  // namespace cloudreel
