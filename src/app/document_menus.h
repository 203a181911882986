#pragma once
// The menu bar of a document window: File, Edit, View and Layer. Every item
// forwards to the core; each menu asks the core which items are enabled,
// checked and how they are titled as it opens.

namespace cloudreel::app {

class Application;
class DocumentWindow;

void buildDocumentMenus(DocumentWindow& window, Application& application);

}  // namespace cloudreel::app
