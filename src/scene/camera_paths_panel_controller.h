#pragma once
// The camera paths and transform stacks panel: the front document's stored
// camera paths and its transform stacks, and the members of the chosen
// stack. Paths and stacks are added and removed, members added (from the
// chosen path), removed and reordered, and each member's gain and switches
// edited; every edit is one undo step of the document and ends in its
// hasChanged.

#include <cstddef>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/value.h"
#include "scene/document_panel_controller.h"

namespace cloudreel {

class CameraPath;
class TransformStack;
class TransformStackMember;

class CameraPathsPanelController : public DocumentPanelController {
 public:
  // One line of a list: a path, stack or member, its name, its kind and its
  // length in frames.
  struct Row {
    std::string title;
    std::string kind;
    int frames = 0;
  };

  // The member values the panel edits, by their keys.
  enum class MemberValue {
    TranslationGain,
    EnableRotation,
    EnableTranslation,
    InvertRotation,
    InvertTranslation
  };
  static std::string_view keyForMemberValue(MemberValue value);

  CameraPathsPanelController() = default;

  // --- the stored camera paths
  std::vector<Row> pathRows() const;
  std::shared_ptr<CameraPath> pathAt(std::size_t index) const;
  // The chosen path; reset when the list no longer holds it.
  std::optional<std::size_t> selectedPath() const { return selectedPath_; }
  void selectPath(std::optional<std::size_t> index);
  // A new interpolated path ("New Camera Path"), chosen.
  void addCameraPath();
  // The document's selected layer as a stored path, when it is a camera
  // path not stored yet; answers whether it was added.
  bool addSelectedLayerAsPath();
  // Removes the chosen path ("Remove Camera Path"); nothing without one.
  void removeSelectedPath();

  // --- the transform stacks
  std::vector<Row> stackRows() const;
  std::shared_ptr<TransformStack> stackAt(std::size_t index) const;
  std::optional<std::size_t> selectedStack() const { return selectedStack_; }
  void selectStack(std::optional<std::size_t> index);
  // A new empty stack ("New Transform Stack"), chosen.
  void addTransformStack();
  // Removes the chosen stack ("Remove Transform Stack").
  void removeSelectedStack();

  // --- the chosen stack's members (empty without a chosen stack)
  std::vector<Row> memberRows() const;
  std::shared_ptr<TransformStackMember> memberAt(std::size_t index) const;
  // Appends a member for the chosen path ("Add Stack Member"); a stack is
  // never made a member of itself. Answers whether a member was added.
  bool addSelectedPathToStack();
  // Each answers NO, changing nothing, for an index outside the members or
  // a move past either end.
  bool removeMember(std::size_t index);
  bool moveMemberUp(std::size_t index);
  bool moveMemberDown(std::size_t index);
  // The member's value (a float gain or a boolean switch); null outside the
  // members.
  Value memberValue(std::size_t index, MemberValue which) const;
  // Sets it as one undo step named after the value; NO outside the members
  // or for a value of the wrong type.
  bool setMemberValue(std::size_t index, MemberValue which, const Value& value);

  // Called after anything shown changed (the shell redraws).
  void setReloadHandler(std::function<void()> handler) { reloadHandler_ = std::move(handler); }

 protected:
  void documentDidChange() override;
  void documentContentsDidChange() override;

 private:
  void reload();
  bool replaceMembers(
      std::size_t stackIndex, std::string actionName,
      const std::function<bool(std::vector<std::shared_ptr<TransformStackMember>>&)>& edit);

  std::optional<std::size_t> selectedPath_;
  std::optional<std::size_t> selectedStack_;
  std::function<void()> reloadHandler_;
};

}  // namespace cloudreel
