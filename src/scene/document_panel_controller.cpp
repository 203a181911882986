#include "scene/document_panel_controller.h"

#include <string>

#include "scene/application_commands.h"
#include "scene/my_document.h"

namespace cloudreel {

DocumentPanelController::DocumentPanelController() {
  NotificationCenter& center = NotificationCenter::defaultCenter();
  center.addObserver(*this, std::string(kDocumentActivateNotification), nullptr,
                     [this](const Notification& n) {
                       const auto* window = static_cast<const DocumentWindowController*>(n.object);
                       setDocument(window != nullptr ? window->document() : nullptr);
                     });
  center.addObserver(*this, std::string(kDocumentDeactivateNotification), nullptr,
                     [this](const Notification&) { setDocument(nullptr); });
  center.addObserver(*this, std::string(kDocumentCloseNotification), nullptr,
                     [this](const Notification& n) {
                       if (n.object == observedDocument_) {
                         setDocument(nullptr);
                       }
                     });
}

DocumentPanelController::~DocumentPanelController() {
  NotificationCenter::defaultCenter().removeObserver(*this);
}

void DocumentPanelController::setDocument(const std::shared_ptr<MyDocument>& document) {
  if (document.get() == observedDocument_ && document_.lock() == document) {
    return;
  }
  NotificationCenter& center = NotificationCenter::defaultCenter();
  if (observedDocument_ != nullptr) {
    center.removeObserver(*this, kDocumentChangeNotification, observedDocument_);
  }
  document_ = document;
  observedDocument_ = document.get();
  if (document) {
    center.addObserver(*this, std::string(kDocumentChangeNotification), document.get(),
                       [this](const Notification&) { documentContentsDidChange(); });
  }
  documentDidChange();
}

}  // namespace cloudreel
