#pragma once
// Undo and redo. A change registers its inverse (a target and a callable)
// and names the step ("Scale", "New Layer"); registrations made while
// undoing become the redo step, and those made while redoing the next undo
// step. The common pattern: a property change is observed, the observer
// registers "set the old value back", and undoing that set is itself
// observed and so registers the redo.
//
// Registrations of one user event form one step: the first registration
// opens a group, which closes at the end of the event (closeEventGroup, or
// automatically on the next pass of the run loop given at construction), or
// before an undo or redo.

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace cloudreel {

class RunLoop;

class UndoManager {
 public:
  using Action = std::function<void()>;

  // With a run loop, the group opened for an event closes on the loop's next
  // pass; without one, only closeEventGroup, undo or redo close it.
  explicit UndoManager(RunLoop* eventLoop = nullptr);
  UndoManager(const UndoManager&) = delete;
  UndoManager& operator=(const UndoManager&) = delete;

  void registerUndoWithTarget(const void* target, Action action);
  // Names the step being built, or else the latest step: the undo step
  // normally and while redoing, the redo step while undoing.
  void setActionName(std::string name);

  bool canUndo() const { return !undoStack_.empty() || openGroupHasActions(); }
  bool canRedo() const { return !redoStack_.empty(); }
  void undo();
  void redo();
  std::string undoActionName() const;
  std::string redoActionName() const;
  bool isUndoing() const { return undoing_; }
  bool isRedoing() const { return redoing_; }

  // Explicit grouping; groups nest, and the outermost one becomes a step.
  void beginUndoGrouping();
  void endUndoGrouping();
  int groupingLevel() const { return static_cast<int>(open_.size()); }
  bool groupsByEvent() const { return groupsByEvent_; }
  void setGroupsByEvent(bool value) { groupsByEvent_ = value; }
  // The front end calls this at the end of each user event.
  void closeEventGroup();

  // While disabled (calls nest), registrations and action names are ignored.
  void disableUndoRegistration() { ++disabled_; }
  void enableUndoRegistration();
  bool isUndoRegistrationEnabled() const { return disabled_ == 0; }

  void removeAllActions();
  // Forgets every action registered for the target, e.g. when it goes away.
  void removeAllActionsWithTarget(const void* target);

  // What changed the history, for a document's edited mark: a new step was
  // begun (told at its first registration, so the mark shows while the
  // event still runs), a step was undone or redone, or everything was
  // forgotten.
  enum class Change { Done, Undone, Redone, Cleared };
  void setChangeHandler(std::function<void(Change)> handler) { changeHandler_ = std::move(handler); }

 private:
  struct Entry {
    const void* target;
    Action action;
  };
  struct Group {
    std::string actionName;
    std::vector<Entry> entries;
  };

  bool openGroupHasActions() const;
  void closeGroupOnto(Group group);
  std::vector<Group>& stackReceivingSteps();
  void runGroup(Group group, bool asUndo);
  void tell(Change change) const;

  RunLoop* eventLoop_;
  std::vector<Group> undoStack_;
  std::vector<Group> redoStack_;
  std::vector<Group> open_;
  bool eventGroupOpen_ = false;
  // Tells a posted close which event group it was posted for, so that it
  // never closes a later one.
  std::uint64_t eventGroupSerial_ = 0;
  // Posted closes hold this weakly: a manager destroyed before the loop runs
  // them is left alone.
  std::shared_ptr<const int> alive_ = std::make_shared<const int>(0);
  bool groupsByEvent_ = true;
  bool undoing_ = false;
  bool redoing_ = false;
  int disabled_ = 0;
  std::function<void(Change)> changeHandler_;
};

}  // namespace cloudreel
