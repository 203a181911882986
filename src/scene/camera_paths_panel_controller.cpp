#include "scene/camera_paths_panel_controller.h"

#include <algorithm>
#include <utility>

#include "camera/camera_path.h"
#include "camera/slerp_camera_path.h"
#include "camera/transform_stack.h"
#include "scene/my_document.h"

namespace cloudreel {

namespace {

using Members = std::vector<std::shared_ptr<TransformStackMember>>;
using Stacks = std::vector<std::shared_ptr<TransformStack>>;

CameraPathsPanelController::Row rowForPath(const CameraPath& path) {
  return {path.name(), std::string(path.className()), path.nFrames()};
}

// The undo actions below live in the document's undo manager, so the
// document they name outlives them; each registers its own inverse, which
// makes the undo of an undo its redo.
void replaceStacks(MyDocument& document, Stacks stacks, const std::string& actionName) {
  UndoManager& undo = document.undoManager();
  undo.registerUndoWithTarget(&document, [&document, old = document.transformStacks(), actionName] {
    replaceStacks(document, old, actionName);
  });
  if (!undo.isUndoing()) {
    undo.setActionName(actionName);
  }
  document.setTransformStacks(std::move(stacks));
  document.hasChanged();
}

void storeMembers(MyDocument& document, const std::shared_ptr<TransformStack>& stack,
                  Members members, const std::string& actionName) {
  UndoManager& undo = document.undoManager();
  undo.registerUndoWithTarget(&document,
                              [&document, stack, old = stack->transformations(), actionName] {
                                storeMembers(document, stack, old, actionName);
                              });
  if (!undo.isUndoing()) {
    undo.setActionName(actionName);
  }
  stack->setTransformations(std::move(members));
  document.hasChanged();
}

void changeMemberValue(MyDocument& document, const std::shared_ptr<TransformStackMember>& member,
                       std::string_view key, const Value& value, const std::string& actionName) {
  UndoManager& undo = document.undoManager();
  undo.registerUndoWithTarget(
      &document, [&document, member, key = std::string(key), old = member->valueForKey(key),
                  actionName] { changeMemberValue(document, member, key, old, actionName); });
  if (!undo.isUndoing()) {
    undo.setActionName(actionName);
  }
  member->setValueForKey(value, key);
  document.hasChanged();
}

std::string actionNameForMemberValue(CameraPathsPanelController::MemberValue which) {
  using V = CameraPathsPanelController::MemberValue;
  switch (which) {
    case V::TranslationGain:
      return "Change Translation Gain";
    case V::EnableRotation:
      return "Change Enable Rotation";
    case V::EnableTranslation:
      return "Change Enable Translation";
    case V::InvertRotation:
      return "Change Invert Rotation";
    case V::InvertTranslation:
      return "Change Invert Translation";
  }
  return "Change Stack Member";
}

}  // namespace

std::string_view CameraPathsPanelController::keyForMemberValue(MemberValue value) {
  switch (value) {
    case MemberValue::TranslationGain:
      return "translationGain";
    case MemberValue::EnableRotation:
      return "enableRotation";
    case MemberValue::EnableTranslation:
      return "enableTranslation";
    case MemberValue::InvertRotation:
      return "invertRotation";
    case MemberValue::InvertTranslation:
      return "invertTranslation";
  }
  return "translationGain";
}

void CameraPathsPanelController::documentDidChange() {
  selectedPath_.reset();
  selectedStack_.reset();
  reload();
}

void CameraPathsPanelController::documentContentsDidChange() { reload(); }

void CameraPathsPanelController::reload() {
  const auto document = this->document();
  const std::size_t paths = document ? document->storedCameraPaths().size() : 0;
  const std::size_t stacks = document ? document->transformStacks().size() : 0;
  if (selectedPath_ && *selectedPath_ >= paths) {
    selectedPath_.reset();
  }
  if (selectedStack_ && *selectedStack_ >= stacks) {
    selectedStack_.reset();
  }
  if (reloadHandler_) {
    reloadHandler_();
  }
}

// --- paths

std::vector<CameraPathsPanelController::Row> CameraPathsPanelController::pathRows() const {
  std::vector<Row> rows;
  if (const auto document = this->document()) {
    for (const auto& path : document->storedCameraPaths()) {
      rows.push_back(path ? rowForPath(*path) : Row{});
    }
  }
  return rows;
}

std::shared_ptr<CameraPath> CameraPathsPanelController::pathAt(std::size_t index) const {
  const auto document = this->document();
  if (!document || index >= document->storedCameraPaths().size()) {
    return nullptr;
  }
  return document->storedCameraPaths()[index];
}

void CameraPathsPanelController::selectPath(std::optional<std::size_t> index) {
  selectedPath_ = index && pathAt(*index) ? index : std::nullopt;
  if (reloadHandler_) {
    reloadHandler_();
  }
}

void CameraPathsPanelController::addCameraPath() {
  const auto document = this->document();
  if (!document) {
    return;
  }
  document->addCameraPath(std::make_shared<SLERPCameraPath>());
  selectPath(document->storedCameraPaths().size() - 1);
}

bool CameraPathsPanelController::addSelectedLayerAsPath() {
  const auto document = this->document();
  const auto path =
      document ? std::dynamic_pointer_cast<CameraPath>(document->selectedLayer()) : nullptr;
  if (!path) {
    return false;
  }
  const auto& stored = document->storedCameraPaths();
  if (std::find(stored.begin(), stored.end(), path) != stored.end()) {
    return false;
  }
  document->addCameraPath(path);
  selectPath(document->storedCameraPaths().size() - 1);
  return true;
}

void CameraPathsPanelController::removeSelectedPath() {
  const auto document = this->document();
  if (!document || !selectedPath_) {
    return;
  }
  document->removeObjectFromCameraPathsAtIndex(static_cast<int>(*selectedPath_));
}

// --- stacks

std::vector<CameraPathsPanelController::Row> CameraPathsPanelController::stackRows() const {
  std::vector<Row> rows;
  if (const auto document = this->document()) {
    for (const auto& stack : document->transformStacks()) {
      rows.push_back(stack ? rowForPath(*stack) : Row{});
    }
  }
  return rows;
}

std::shared_ptr<TransformStack> CameraPathsPanelController::stackAt(std::size_t index) const {
  const auto document = this->document();
  if (!document || index >= document->transformStacks().size()) {
    return nullptr;
  }
  return document->transformStacks()[index];
}

void CameraPathsPanelController::selectStack(std::optional<std::size_t> index) {
  selectedStack_ = index && stackAt(*index) ? index : std::nullopt;
  if (reloadHandler_) {
    reloadHandler_();
  }
}

void CameraPathsPanelController::addTransformStack() {
  const auto document = this->document();
  if (!document) {
    return;
  }
  Stacks stacks = document->transformStacks();
  stacks.push_back(std::make_shared<TransformStack>());
  replaceStacks(*document, std::move(stacks), "New Transform Stack");
  selectStack(document->transformStacks().size() - 1);
}

void CameraPathsPanelController::removeSelectedStack() {
  const auto document = this->document();
  if (!document || !selectedStack_ || *selectedStack_ >= document->transformStacks().size()) {
    return;
  }
  Stacks stacks = document->transformStacks();
  stacks.erase(stacks.begin() + static_cast<std::ptrdiff_t>(*selectedStack_));
  replaceStacks(*document, std::move(stacks), "Remove Transform Stack");
}

// --- members

std::vector<CameraPathsPanelController::Row> CameraPathsPanelController::memberRows() const {
  std::vector<Row> rows;
  const auto stack = selectedStack_ ? stackAt(*selectedStack_) : nullptr;
  if (!stack) {
    return rows;
  }
  for (const auto& member : stack->transformations()) {
    Row row;
    if (member && member->path()) {
      row = rowForPath(*member->path());
      // A member read from a document has no name of its own.
      if (!member->name().empty()) {
        row.title = member->name();
      }
    }
    rows.push_back(std::move(row));
  }
  return rows;
}

std::shared_ptr<TransformStackMember> CameraPathsPanelController::memberAt(
    std::size_t index) const {
  const auto stack = selectedStack_ ? stackAt(*selectedStack_) : nullptr;
  if (!stack || index >= stack->transformations().size()) {
    return nullptr;
  }
  return stack->transformations()[index];
}

bool CameraPathsPanelController::replaceMembers(
    std::size_t stackIndex, std::string actionName,
    const std::function<bool(std::vector<std::shared_ptr<TransformStackMember>>&)>& edit) {
  const auto document = this->document();
  const auto stack = stackAt(stackIndex);
  if (!document || !stack) {
    return false;
  }
  Members members = stack->transformations();
  if (!edit(members)) {
    return false;
  }
  storeMembers(*document, stack, std::move(members), actionName);
  return true;
}

bool CameraPathsPanelController::addSelectedPathToStack() {
  const auto path = selectedPath_ ? pathAt(*selectedPath_) : nullptr;
  const auto stack = selectedStack_ ? stackAt(*selectedStack_) : nullptr;
  if (!path || !stack || path == stack) {
    return false;
  }
  return replaceMembers(*selectedStack_, "Add Stack Member", [&](Members& members) {
    members.push_back(TransformStackMember::initWithCameraPath(path));
    return true;
  });
}

bool CameraPathsPanelController::removeMember(std::size_t index) {
  return selectedStack_ &&
         replaceMembers(*selectedStack_, "Remove Stack Member", [index](Members& members) {
           if (index >= members.size()) {
             return false;
           }
           members.erase(members.begin() + static_cast<std::ptrdiff_t>(index));
           return true;
         });
}

bool CameraPathsPanelController::moveMemberUp(std::size_t index) {
  return selectedStack_ &&
         replaceMembers(*selectedStack_, "Move Stack Member", [index](Members& members) {
           if (index == 0 || index >= members.size()) {
             return false;
           }
           std::swap(members[index - 1], members[index]);
           return true;
         });
}

bool CameraPathsPanelController::moveMemberDown(std::size_t index) {
  return selectedStack_ &&
         replaceMembers(*selectedStack_, "Move Stack Member", [index](Members& members) {
           if (index + 1 >= members.size()) {
             return false;
           }
           std::swap(members[index], members[index + 1]);
           return true;
         });
}

Value CameraPathsPanelController::memberValue(std::size_t index, MemberValue which) const {
  const auto member = memberAt(index);
  return member ? member->valueForKey(keyForMemberValue(which)) : Value{};
}

bool CameraPathsPanelController::setMemberValue(std::size_t index, MemberValue which,
                                                const Value& value) {
  const auto document = this->document();
  const auto member = memberAt(index);
  const bool isGain = which == MemberValue::TranslationGain;
  const bool isSwitch = std::holds_alternative<bool>(value);
  const bool fits = isGain ? isNumber(value) && !isSwitch : isSwitch;
  if (!document || !member || !fits) {
    return false;
  }
  changeMemberValue(*document, member, keyForMemberValue(which), value,
                    actionNameForMemberValue(which));
  return true;
}

}  // namespace cloudreel
