#include "platform/undo_manager.h"

#include <algorithm>
#include <cassert>
#include <utility>

#include "platform/run_loop.h"

namespace cloudreel {

UndoManager::UndoManager(RunLoop* eventLoop) : eventLoop_(eventLoop) {}

std::vector<UndoManager::Group>& UndoManager::stackReceivingSteps() {
  return undoing_ ? redoStack_ : undoStack_;
}

bool UndoManager::openGroupHasActions() const {
  return std::any_of(open_.begin(), open_.end(),
                     [](const Group& g) { return !g.entries.empty(); });
}

void UndoManager::registerUndoWithTarget(const void* target, Action action) {
  if (disabled_ > 0) {
    return;
  }
  const bool newChange = !undoing_ && !redoing_;
  const bool beginsStep = newChange && !openGroupHasActions();
  if (newChange) {
    // A new change makes the redo history meaningless.
    redoStack_.clear();
  }
  if (beginsStep) {
    tell(Change::Done);
  }
  if (open_.empty()) {
    if (groupsByEvent_) {
      open_.push_back({});
      eventGroupOpen_ = true;
      const std::uint64_t serial = ++eventGroupSerial_;
      if (eventLoop_ != nullptr) {
        eventLoop_->post([this, serial, alive = std::weak_ptr<const int>(alive_)] {
          if (!alive.expired() && serial == eventGroupSerial_) {
            closeEventGroup();
          }
        });
      }
    } else {
      // With neither an explicit group nor event grouping, each registration
      // is a step of its own.
      stackReceivingSteps().push_back(Group{{}, {Entry{target, std::move(action)}}});
      return;
    }
  }
  open_.back().entries.push_back(Entry{target, std::move(action)});
}

void UndoManager::setActionName(std::string name) {
  // A change made while registration is off registered nothing, so its name
  // must not rename the step before it.
  if (disabled_ > 0) {
    return;
  }
  if (!open_.empty()) {
    open_.front().actionName = std::move(name);
    return;
  }
  auto& stack = stackReceivingSteps();
  if (!stack.empty()) {
    stack.back().actionName = std::move(name);
  }
}

void UndoManager::beginUndoGrouping() { open_.push_back({}); }

void UndoManager::endUndoGrouping() {
  assert(!open_.empty() && "endUndoGrouping without beginUndoGrouping");
  if (open_.empty()) {
    return;  // unbalanced call: nothing to close
  }
  Group group = std::move(open_.back());
  open_.pop_back();
  if (open_.empty()) {
    eventGroupOpen_ = false;
    closeGroupOnto(std::move(group));
  } else {
    // A nested group's actions join its parent's in order; the outer name wins
    // unless the outer group has none.
    Group& parent = open_.back();
    if (parent.actionName.empty()) {
      parent.actionName = std::move(group.actionName);
    }
    for (Entry& e : group.entries) {
      parent.entries.push_back(std::move(e));
    }
  }
}

void UndoManager::closeGroupOnto(Group group) {
  if (!group.entries.empty()) {
    stackReceivingSteps().push_back(std::move(group));
  }
}

void UndoManager::closeEventGroup() {
  if (eventGroupOpen_ && open_.size() == 1) {
    endUndoGrouping();
  }
}

void UndoManager::runGroup(Group group, bool asUndo) {
  // The inverse step is built in a group of its own that keeps the name of
  // the step being undone unless an action sets another.
  bool& flag = asUndo ? undoing_ : redoing_;
  flag = true;
  open_.push_back(Group{group.actionName, {}});
  for (auto it = group.entries.rbegin(); it != group.entries.rend(); ++it) {
    it->action();
  }
  Group inverse = std::move(open_.back());
  open_.pop_back();
  closeGroupOnto(std::move(inverse));
  flag = false;
}

void UndoManager::undo() {
  closeEventGroup();
  if (!open_.empty() || undoStack_.empty()) {
    return;  // inside an explicit group, or nothing to undo
  }
  Group group = std::move(undoStack_.back());
  undoStack_.pop_back();
  runGroup(std::move(group), true);
  tell(Change::Undone);
}

void UndoManager::redo() {
  closeEventGroup();
  if (!open_.empty() || redoStack_.empty()) {
    return;
  }
  Group group = std::move(redoStack_.back());
  redoStack_.pop_back();
  runGroup(std::move(group), false);
  tell(Change::Redone);
}

void UndoManager::tell(Change change) const {
  if (changeHandler_) {
    changeHandler_(change);
  }
}

std::string UndoManager::undoActionName() const {
  if (!open_.empty() && openGroupHasActions()) {
    return open_.front().actionName;
  }
  return undoStack_.empty() ? std::string() : undoStack_.back().actionName;
}

std::string UndoManager::redoActionName() const {
  return redoStack_.empty() ? std::string() : redoStack_.back().actionName;
}

void UndoManager::enableUndoRegistration() {
  if (disabled_ > 0) {
    --disabled_;
  }
}

void UndoManager::removeAllActions() {
  undoStack_.clear();
  redoStack_.clear();
  open_.clear();
  eventGroupOpen_ = false;
  tell(Change::Cleared);
}

void UndoManager::removeAllActionsWithTarget(const void* target) {
  auto strip = [target](std::vector<Group>& groups) {
    for (Group& g : groups) {
      std::erase_if(g.entries, [target](const Entry& e) { return e.target == target; });
    }
  };
  strip(open_);
  strip(undoStack_);
  strip(redoStack_);
  auto empty = [](const Group& g) { return g.entries.empty(); };
  std::erase_if(undoStack_, empty);
  std::erase_if(redoStack_, empty);
}

}  // namespace cloudreel

