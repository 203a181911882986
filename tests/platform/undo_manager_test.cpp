#include "platform/undo_manager.h"

#include <gtest/gtest.h>

#include "platform/object.h"
#include "platform/run_loop.h"

namespace cloudreel {
namespace {

class Shape : public Object {
 public:
  const PropertyTable& properties() const override {
    static const PropertyTable table(&Object::objectProperties(),
                                     {property<Shape>("scale", &Shape::scale, &Shape::setScale),
                                      property<Shape>("name", &Shape::name, &Shape::setName)});
    return table;
  }
  double scale() const { return scale_; }
  void setScale(double v) { changeValueForKey("scale", scale_, v); }
  std::string name() const { return name_; }
  void setName(std::string v) { changeValueForKey("name", name_, std::move(v)); }

 private:
  double scale_ = 1.0;
  std::string name_ = "shape";
};

// The document's way of making property edits undoable: observe with the
// action name as context, and register "set the old value back".
class Editor : public Observer {
 public:
  explicit Editor(UndoManager& undo) : undo_(undo) {}
  void observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath, Object& object,
                                                   const Change& change,
                                                   std::string_view context) override {
    const ObjectPtr target = object.shared_from_this();
    const Value old = change.oldValue.value_or(Value{});
    undo_.registerUndoWithTarget(
        this, [key = std::string(keyPath), target, old] { target->setValueForKeyPath(old, key); });
    undo_.setActionName(std::string(context));
  }

 private:
  UndoManager& undo_;
};

TEST(UndoManager, ObservedPropertyChangesUndoAndRedoWithTheirActionNames) {
  UndoManager undo;
  Editor editor(undo);
  auto shape = std::make_shared<Shape>();
  shape->addObserver(editor, "scale", ObservingOptions::Old, "Scale");
  shape->addObserver(editor, "name", ObservingOptions::Old, "Change Name");

  shape->setScale(2.0);
  undo.closeEventGroup();
  shape->setName("ball");
  undo.closeEventGroup();
  EXPECT_EQ(undo.undoActionName(), "Change Name");

  undo.undo();
  EXPECT_EQ(shape->name(), "shape");
  EXPECT_EQ(undo.undoActionName(), "Scale");
  EXPECT_EQ(undo.redoActionName(), "Change Name");

  undo.undo();
  EXPECT_EQ(shape->scale(), 1.0);
  EXPECT_FALSE(undo.canUndo());
  EXPECT_EQ(undo.redoActionName(), "Scale");

  undo.redo();
  EXPECT_EQ(shape->scale(), 2.0);
  EXPECT_EQ(undo.undoActionName(), "Scale");
  undo.redo();
  EXPECT_EQ(shape->name(), "ball");
  EXPECT_FALSE(undo.canRedo());

  // The round trip can go on: undoing again still works from the redone state.
  undo.undo();
  undo.undo();
  EXPECT_EQ(shape->scale(), 1.0);
  EXPECT_EQ(shape->name(), "shape");

  // A fresh edit clears what could have been redone.
  shape->setScale(3.0);
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

}  // namespace
}  // namespace cloudreel
