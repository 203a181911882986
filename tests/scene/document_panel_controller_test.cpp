#include "scene/document_panel_controller.h"

#include <gtest/gtest.h>

#include "scene/application_commands.h"
#include "scene/layer.h"
#include "scene/my_document.h"
#include "support/memory_defaults.h"

namespace cloudreel {
namespace {

class Window : public DocumentWindowController {
 public:
  explicit Window(std::shared_ptr<MyDocument> d) : doc(std::move(d)) {}
  std::shared_ptr<MyDocument> document() const override { return doc; }
  void zoomIn() override {}
  void zoomOut() override {}
  std::shared_ptr<MyDocument> doc;
};

class CountingPanel : public DocumentPanelController {
 public:
  int switches = 0;
  int edits = 0;

 protected:
  void documentDidChange() override { ++switches; }
  void documentContentsDidChange() override { ++edits; }
};

void post(std::string_view name, const Window* window) {
  NotificationCenter::defaultCenter().postNotificationName(
      std::string(name), static_cast<const DocumentWindowController*>(window));
}

TEST(DocumentPanelController, FollowsTheFrontDocumentAndHearsOnlyItsEdits) {
  testing::MemoryDefaults defaults;
  Window first{std::make_shared<MyDocument>()};
  Window second{std::make_shared<MyDocument>()};
  CountingPanel panel;
  EXPECT_EQ(panel.document(), nullptr);

  post(kDocumentActivateNotification, &first);
  EXPECT_EQ(panel.document(), first.doc);
  post(kDocumentActivateNotification, &first);  // the same again: no switch
  EXPECT_EQ(panel.switches, 1);
  first.doc->hasChanged();
  second.doc->hasChanged();  // not the followed one
  EXPECT_EQ(panel.edits, 1);

  post(kDocumentActivateNotification, &second);
  first.doc->hasChanged();
  EXPECT_EQ(panel.edits, 1);
  EXPECT_EQ(panel.document(), second.doc);

  // Closing another document leaves the panel; closing its own empties it.
  first.doc->close();
  EXPECT_EQ(panel.document(), second.doc);
  second.doc->close();
  EXPECT_EQ(panel.document(), nullptr);
  post(kDocumentActivateNotification, &first);
  post(kDocumentDeactivateNotification, &first);
  EXPECT_EQ(panel.document(), nullptr);
  EXPECT_EQ(panel.switches, 5);

  // A document that goes while followed is simply gone.
  post(kDocumentActivateNotification, &first);
  first.doc.reset();
  EXPECT_EQ(panel.document(), nullptr);
}

}  // namespace
}  // namespace cloudreel
