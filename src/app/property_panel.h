#pragma once
// The properties panel: a floating tool window that edits whatever the
// front document has selected, with one control per field of the core's
// property sheet (spin boxes, check boxes, menus, colour buttons, text
// fields), grouped by section. Every edit goes to the PropertySheetController,
// which makes it one undo step; the panel only draws and forwards.
//
// Each control is named after its field's key path, so it can be found
// ("pointSize", "frTranslate.x").

#include <QWidget>
#include <cstddef>
#include <memory>
#include <vector>

#include "scene/property_sheet_controller.h"

class QLabel;
class QVBoxLayout;

namespace cloudreel::app {

class PropertyPanel : public QWidget, public PropertySheetView {
  Q_OBJECT
 public:
  // Shows the document in front now; then follows the front document.
  explicit PropertyPanel(const std::shared_ptr<MyDocument>& document);
  ~PropertyPanel() override;

  PropertySheetController& controller() { return controller_; }

 private:
  struct Control {
    std::size_t section;
    std::size_t field;
    QWidget* widget;
  };

  void reloadSheet() override;
  void refreshValues() override;
  QWidget* makeControl(std::size_t section, std::size_t field, const PropertyField& description);
  void showValue(const Control& control);
  void chooseColour(std::size_t section, std::size_t field);

  PropertySheetController controller_;
  QVBoxLayout* layout_ = nullptr;
  QLabel* empty_ = nullptr;
  QWidget* body_ = nullptr;
  std::vector<Control> controls_;
  // Set while values are put into the controls, whose change signals must
  // not come back as edits.
  bool showing_ = false;
};

}  // namespace cloudreel::app
