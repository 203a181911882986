#pragma once
// The properties panel's logic: one panel for the application that edits
// whatever is selected in the front document: its selected layer, or when
// no layer is selected its selected camera, or else its scene camera. It
// follows the front document, the layer selection
// ("KTPointDocument_LayerActivateNotification") and every change the
// document reports, and tells its view to rebuild its controls when what
// is shown changes shape, or only to show new values when it does not.

#include <cstddef>
#include <memory>
#include <string>
#include <vector>

#include "scene/document_panel_controller.h"
#include "scene/property_sheet.h"

namespace cloudreel {

// The panel window the controller drives.
class PropertySheetView {
 public:
  virtual ~PropertySheetView() = default;
  // The sections changed: make the controls anew from sections().
  virtual void reloadSheet() = 0;
  // Same sections, other values: show valueAt() in every control.
  virtual void refreshValues() = 0;
};

class PropertySheetController : public DocumentPanelController {
 public:
  PropertySheetController();
  ~PropertySheetController() override;

  // Not owned; null detaches. The view is told to reload at once.
  void setView(PropertySheetView* view);

  const std::vector<PropertySection>& sections() const { return sections_; }
  // "Properties" and, when something is shown, the name of what is shown
  // ("Properties: square.ply"); "No Selection" otherwise.
  std::string title() const;

  // Null for an index outside the sheet.
  Value valueAt(std::size_t section, std::size_t field) const;
  // One undoable edit of the followed document (PropertySheet::writeValue);
  // NO for an index outside the sheet, without a document, or for a value
  // the field refuses.
  bool setValueAt(std::size_t section, std::size_t field, const Value& value);

  // Reads the selection again and tells the view (what the notifications
  // do; tests may call it).
  void update();

 protected:
  void documentDidChange() override { update(); }
  void documentContentsDidChange() override { update(); }

 private:
  std::shared_ptr<Object> shownObject() const;
  const PropertyField* fieldAt(std::size_t section, std::size_t field) const;

  PropertySheetView* view_ = nullptr;
  std::vector<PropertySection> sections_;
  // What the sections were made for and their keys, to tell a new shape
  // from new values.
  std::vector<std::string> shape_;
  std::weak_ptr<Object> shown_;
  // The sheet rebuilds while writing its own edit only once, at the end.
  bool writing_ = false;
};

}  // namespace cloudreel
