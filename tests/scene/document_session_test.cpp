#include "scene/document_session.h"

#include <gtest/gtest.h>

#include "platform/class_registry.h"
#include "scene/core_classes.h"
#include "scene/my_document.h"
#include "scene/sphere.h"
#include "support/memory_defaults.h"
#include "support/scripted_user_interaction.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

class DocumentSessionTest : public ::testing::Test {
 protected:
  void SetUp() override {
    registerCoreClasses(ClassRegistry::shared());
    previousUser_ = UserInteraction::setShared(user);
  }
  void TearDown() override { UserInteraction::setShared(previousUser_); }

  static void addSphere(DocumentSession& session) {
    session.document()->addLayer(std::make_shared<Sphere>());
    session.document()->undoManager().closeEventGroup();
  }

  testing::MemoryDefaults defaults;
  testing::TempDir dir;
  std::shared_ptr<testing::ScriptedUserInteraction> user =
      std::make_shared<testing::ScriptedUserInteraction>();

 private:
  std::shared_ptr<UserInteraction> previousUser_;
};

TEST_F(DocumentSessionTest, TheEditedMarkFollowsTheHistoryBackToTheSavedStateUntilItIsLost) {
  DocumentSession session(1);
  int handlerCalls = 0;
  session.setEditedHandler([&] { ++handlerCalls; });
  UndoManager& undo = session.document()->undoManager();
  EXPECT_FALSE(session.isDocumentEdited());

  addSphere(session);
  EXPECT_TRUE(session.isDocumentEdited());
  EXPECT_EQ(handlerCalls, 1);
  addSphere(session);  // still edited: the handler is not called again
  EXPECT_EQ(handlerCalls, 1);
  undo.undo();
  undo.undo();
  EXPECT_FALSE(session.isDocumentEdited());
  undo.redo();
  EXPECT_TRUE(session.isDocumentEdited());

  ASSERT_TRUE(session.saveToURL(dir / "scene.reel", nullptr));
  EXPECT_FALSE(session.isDocumentEdited());
  EXPECT_EQ(session.displayName(), "scene.reel");
  undo.undo();
  EXPECT_TRUE(session.isDocumentEdited());
  undo.redo();
  EXPECT_FALSE(session.isDocumentEdited());

  // Undo below the saved state, then change something else: the redo that
  // led back is gone, so no undoing reaches the saved state again.
  undo.undo();
  addSphere(session);
  undo.undo();
  EXPECT_TRUE(session.isDocumentEdited());
  undo.removeAllActions();
  EXPECT_TRUE(session.isDocumentEdited());
  ASSERT_TRUE(session.save(nullptr));
  EXPECT_FALSE(session.isDocumentEdited());
  EXPECT_TRUE(user->savePanels.empty());  // a titled document saves in place
}

TEST_F(DocumentSessionTest, ClosingAnEditedDocumentAsksAndSavesOnlyWhereTheUserChose) {
  DocumentSession unedited(2);
  EXPECT_EQ(unedited.displayName(), "Untitled 2");
  EXPECT_TRUE(unedited.canClose());
  EXPECT_TRUE(user->alerts.empty());

  DocumentSession session(1);
  EXPECT_EQ(session.displayName(), "Untitled");
  addSphere(session);
  user->answerAlertsWith({1});  // Cancel
  EXPECT_FALSE(session.canClose());
  ASSERT_EQ(user->alerts.size(), 1u);
  EXPECT_EQ(user->alerts[0].messageText,
            "Do you want to save the changes made to the document \u201cUntitled\u201d?");
  EXPECT_EQ(user->alerts[0].buttons, (std::vector<std::string>{"Save", "Cancel", "Don't Save"}));

  user->answerAlertsWith({0});  // Save, then cancel the panel: stays open
  user->answerSavePanelWith(std::nullopt);
  EXPECT_FALSE(session.canClose());
  ASSERT_EQ(user->savePanels.size(), 1u);
  EXPECT_EQ(user->savePanels[0].nameFieldValue, "Untitled.reel");
  EXPECT_EQ(user->savePanels[0].requiredFileType, "reel");
  EXPECT_TRUE(user->errors.empty());

  // A save that fails is shown and keeps the document open.
  user->answerAlertsWith({0});
  user->answerSavePanelWith((dir / "no such folder" / "a.reel").string());
  EXPECT_FALSE(session.canClose());
  EXPECT_EQ(user->errors.size(), 1u);

  user->answerAlertsWith({0});
  user->answerSavePanelWith((dir / "kept.reel").string());
  EXPECT_TRUE(session.canClose());
  EXPECT_TRUE(std::filesystem::exists(dir / "kept.reel"));
  EXPECT_EQ(session.displayName(), "kept.reel");

  addSphere(session);
  user->answerAlertsWith({2});  // Don't Save
  EXPECT_TRUE(session.canClose());
}

TEST_F(DocumentSessionTest, OpenAndRevertReadTheFileAndStartAFreshHistory) {
  Error error;
  EXPECT_EQ(DocumentSession::open(dir / "missing.reel", &error), nullptr);
  EXPECT_FALSE(error.message.empty());

  {
    DocumentSession first(1);
    addSphere(first);
    ASSERT_TRUE(first.saveToURL(dir / "one.reel", nullptr));
  }
  const auto session = DocumentSession::open(dir / "one.reel", nullptr);
  ASSERT_NE(session, nullptr);
  EXPECT_FALSE(session->isDocumentEdited());
  EXPECT_FALSE(session->document()->undoManager().canUndo());
  EXPECT_EQ(session->document()->layers().size(), 1u);
  EXPECT_FALSE(session->revertToSaved(nullptr));  // nothing to revert
  EXPECT_TRUE(user->alerts.empty());

  addSphere(*session);
  user->answerAlertsWith({1});  // Cancel
  EXPECT_FALSE(session->revertToSaved(nullptr));
  EXPECT_EQ(session->document()->layers().size(), 2u);
  user->answerAlertsWith({0});
  EXPECT_TRUE(session->revertToSaved(nullptr));
  EXPECT_EQ(session->document()->layers().size(), 1u);
  EXPECT_FALSE(session->isDocumentEdited());
  EXPECT_EQ(user->alerts.back().buttons, (std::vector<std::string>{"Revert", "Cancel"}));
}

TEST_F(DocumentSessionTest, RecentDocumentsKeepsTheNewestTenOnceEach) {
  RecentDocuments recent(UserDefaults::standardUserDefaults());
  EXPECT_TRUE(recent.urls().empty());
  for (int i = 0; i < 12; ++i) {
    recent.noteURL(dir / ("d" + std::to_string(i) + ".reel"));
  }
  recent.noteURL(dir / "d5.reel");
  recent.noteURL(dir / "bad\nname.reel");  // cannot be listed: left out
  const auto urls = RecentDocuments(UserDefaults::standardUserDefaults()).urls();
  ASSERT_EQ(urls.size(), RecentDocuments::kMaximumCount);
  EXPECT_EQ(urls[0], dir / "d5.reel");
  EXPECT_EQ(urls[1], dir / "d11.reel");
  EXPECT_EQ(std::count(urls.begin(), urls.end(), dir / "d5.reel"), 1);
  recent.clear();
  EXPECT_TRUE(recent.urls().empty());
}

}  // namespace
}  // namespace cloudreel
