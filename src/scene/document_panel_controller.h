#pragma once
// The base of the floating panels (timeline, cameras, camera paths,
// property sheets, view controls): one panel for the whole application that
// shows whichever document is in front. It follows the document windows'
// activate and deactivate notifications and the document's close, and hears
// every change the followed document reports.

#include <memory>

#include "platform/notification_center.h"
#include "platform/object.h"

namespace cloudreel {

class MyDocument;

class DocumentPanelController : public Observer {
 public:
  // Starts following the front document (none until a window activates).
  DocumentPanelController();
  ~DocumentPanelController() override;
  DocumentPanelController(const DocumentPanelController&) = delete;
  DocumentPanelController& operator=(const DocumentPanelController&) = delete;

  // The document followed; null when no document window is in front or the
  // document has gone.
  std::shared_ptr<MyDocument> document() const { return document_.lock(); }
  // Follows this document until the next activation (what an activation
  // does; tests call it directly).
  void setDocument(const std::shared_ptr<MyDocument>& document);

 protected:
  // After the followed document was replaced (by another or by none).
  virtual void documentDidChange() {}
  // After the followed document reported an edit (its hasChanged).
  virtual void documentContentsDidChange() {}

 private:
  std::weak_ptr<MyDocument> document_;
  const void* observedDocument_ = nullptr;
};

}  // namespace cloudreel
