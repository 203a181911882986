#include "scene/camera_paths_panel_controller.h"

#include <gtest/gtest.h>

#include "camera/slerp_camera_path.h"
#include "camera/transform_stack.h"
#include "scene/my_document.h"
#include "support/memory_defaults.h"

namespace cloudreel {
namespace {

using MemberValue = CameraPathsPanelController::MemberValue;

// Each call is one user event: one undo step.
void endEvent(MyDocument& document) { document.undoManager().closeEventGroup(); }

std::vector<std::string> titles(const std::vector<CameraPathsPanelController::Row>& rows) {
  std::vector<std::string> out;
  for (const auto& row : rows) {
    out.push_back(row.title);
  }
  return out;
}

TEST(CameraPathsPanelController, PathsAndStacksAreAddedAndRemovedAsUndoSteps) {
  testing::MemoryDefaults defaults;
  auto document = std::make_shared<MyDocument>();
  CameraPathsPanelController panel;
  panel.setDocument(document);
  // A new document has one empty stack and no stored paths.
  EXPECT_TRUE(panel.pathRows().empty());
  ASSERT_EQ(panel.stackRows().size(), 1u);
  EXPECT_EQ(panel.stackRows()[0].title, "New stack");

  panel.addCameraPath();
  endEvent(*document);
  ASSERT_EQ(panel.pathRows().size(), 1u);
  EXPECT_EQ(panel.pathRows()[0].kind, "SLERPCameraPath");
  EXPECT_EQ(panel.pathRows()[0].frames, 200);
  EXPECT_EQ(panel.selectedPath(), 0u);
  EXPECT_EQ(document->undoManager().undoActionName(), "New Camera Path");

  panel.addTransformStack();
  endEvent(*document);
  EXPECT_EQ(document->transformStacks().size(), 2u);
  EXPECT_EQ(panel.selectedStack(), 1u);
  EXPECT_EQ(document->undoManager().undoActionName(), "New Transform Stack");
  const auto added = document->transformStacks()[1];
  panel.selectStack(0);
  panel.removeSelectedStack();
  endEvent(*document);
  ASSERT_EQ(document->transformStacks().size(), 1u);
  EXPECT_EQ(document->transformStacks()[0], added);
  EXPECT_EQ(panel.selectedStack(), 0u);  // the row now holds the other stack

  document->undoManager().undo();  // the removal
  EXPECT_EQ(document->transformStacks().size(), 2u);
  document->undoManager().undo();  // the addition
  EXPECT_EQ(document->transformStacks().size(), 1u);
  EXPECT_NE(document->transformStacks()[0], added);
  document->undoManager().redo();
  EXPECT_EQ(document->transformStacks().back(), added);

  panel.selectPath(0);
  panel.removeSelectedPath();
  EXPECT_TRUE(panel.pathRows().empty());
  EXPECT_EQ(panel.selectedPath(), std::nullopt);  // the chosen row went with it
  panel.removeSelectedPath();                     // nothing chosen: nothing happens
  panel.selectPath(5);
  EXPECT_EQ(panel.selectedPath(), std::nullopt);

  // The selected layer becomes a stored path once.
  auto layerPath = std::make_shared<SLERPCameraPath>();
  document->addLayer(layerPath);
  EXPECT_TRUE(panel.addSelectedLayerAsPath());
  EXPECT_FALSE(panel.addSelectedLayerAsPath());
  EXPECT_EQ(document->storedCameraPaths().back(), layerPath);
}

TEST(CameraPathsPanelController, StackMembersAreAddedReorderedAndEditedAsUndoSteps) {
  testing::MemoryDefaults defaults;
  auto document = std::make_shared<MyDocument>();
  CameraPathsPanelController panel;
  panel.setDocument(document);
  EXPECT_FALSE(panel.addSelectedPathToStack());  // nothing chosen
  EXPECT_FALSE(panel.removeMember(0));
  EXPECT_TRUE(isNull(panel.memberValue(0, MemberValue::TranslationGain)));

  auto first = std::make_shared<SLERPCameraPath>();
  first->setName("first");
  auto second = std::make_shared<SLERPCameraPath>();
  second->setName("second");
  document->addCameraPath(first);
  document->addCameraPath(second);
  endEvent(*document);
  panel.selectStack(0);
  panel.selectPath(0);
  ASSERT_TRUE(panel.addSelectedPathToStack());
  endEvent(*document);
  panel.selectPath(1);
  ASSERT_TRUE(panel.addSelectedPathToStack());
  endEvent(*document);
  EXPECT_EQ(titles(panel.memberRows()), (std::vector<std::string>{"first", "second"}));
  EXPECT_EQ(panel.stackRows()[0].frames, 200);

  // Reordering past either end does nothing; within, one step each.
  EXPECT_FALSE(panel.moveMemberUp(0));
  EXPECT_FALSE(panel.moveMemberDown(1));
  EXPECT_FALSE(panel.moveMemberDown(7));
  ASSERT_TRUE(panel.moveMemberDown(0));
  endEvent(*document);
  EXPECT_EQ(titles(panel.memberRows()), (std::vector<std::string>{"second", "first"}));
  EXPECT_EQ(document->undoManager().undoActionName(), "Move Stack Member");

  // Gain and switches, each an undo step; values of the wrong kind refused.
  ASSERT_TRUE(panel.setMemberValue(1, MemberValue::TranslationGain, 2.5));
  endEvent(*document);
  ASSERT_TRUE(panel.setMemberValue(1, MemberValue::EnableRotation, false));
  endEvent(*document);
  EXPECT_FALSE(panel.setMemberValue(1, MemberValue::EnableRotation, 1.0));
  EXPECT_FALSE(panel.setMemberValue(1, MemberValue::TranslationGain, true));
  EXPECT_FALSE(panel.setMemberValue(2, MemberValue::InvertTranslation, true));
  const auto member = panel.memberAt(1);
  EXPECT_EQ(member->path(), first);
  EXPECT_EQ(member->translationGain(), 2.5f);
  EXPECT_FALSE(member->enableRotation());
  EXPECT_EQ(document->undoManager().undoActionName(), "Change Enable Rotation");

  document->undoManager().undo();
  EXPECT_TRUE(member->enableRotation());
  document->undoManager().undo();
  EXPECT_EQ(member->translationGain(), 1.0f);
  document->undoManager().redo();
  EXPECT_EQ(member->translationGain(), 2.5f);
  document->undoManager().undo();
  document->undoManager().undo();  // the move
  EXPECT_EQ(titles(panel.memberRows()), (std::vector<std::string>{"first", "second"}));

  ASSERT_TRUE(panel.removeMember(0));
  endEvent(*document);
  EXPECT_EQ(titles(panel.memberRows()), (std::vector<std::string>{"second"}));
  document->undoManager().undo();
  EXPECT_EQ(titles(panel.memberRows()), (std::vector<std::string>{"first", "second"}));

  // A stack is never a member of itself.
  document->addCameraPath(document->transformStacks()[0]);
  panel.selectPath(2);
  EXPECT_FALSE(panel.addSelectedPathToStack());
}

}  // namespace
}  // namespace cloudreel
