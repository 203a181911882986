#include "scene/property_sheet_controller.h"

#include <cstdio>

#include "camera/camera.h"
#include "camera/scene_camera.h"
#include "platform/notification_center.h"
#include "scene/layer.h"
#include "scene/my_document.h"

namespace cloudreel {

namespace {

std::vector<std::string> shapeOf(const std::vector<PropertySection>& sections) {
  std::vector<std::string> shape;
  for (const auto& section : sections) {
    char identity[32];
    std::snprintf(identity, sizeof identity, "%p", static_cast<const void*>(section.target.get()));
    shape.push_back(section.title + "@" + identity);
    for (const auto& field : section.fields) {
      shape.push_back(field.keyPath + (field.readOnly ? "!" : ""));
    }
  }
  return shape;
}

}  // namespace

PropertySheetController::PropertySheetController() {
  NotificationCenter& center = NotificationCenter::defaultCenter();
  // A layer of the followed document was selected (by the outline, the
  // layer menu or an import): show it. Layers of other documents are not
  // this panel's business.
  center.addObserver(*this, std::string(kLayerActivateNotification), nullptr,
                     [this](const Notification&) { update(); });
}

PropertySheetController::~PropertySheetController() {
  NotificationCenter::defaultCenter().removeObserver(*this);
}

void PropertySheetController::setView(PropertySheetView* view) {
  view_ = view;
  shape_.clear();
  update();
}

std::shared_ptr<Object> PropertySheetController::shownObject() const {
  const auto doc = document();
  if (!doc) {
    return nullptr;
  }
  if (auto layer = doc->selectedLayer()) {
    return layer;
  }
  if (auto camera = doc->selectedCamera()) {
    return camera;
  }
  return doc->sceneCamera();
}

void PropertySheetController::update() {
  if (writing_) {
    return;
  }
  const std::shared_ptr<Object> shown = shownObject();
  std::vector<PropertySection> sections = PropertySheet::sectionsForObject(shown);
  std::vector<std::string> shape = shapeOf(sections);
  const bool reshaped = shape != shape_ || shown != shown_.lock();
  sections_ = std::move(sections);
  shape_ = std::move(shape);
  shown_ = shown;
  if (view_ == nullptr) {
    return;
  }
  if (reshaped) {
    view_->reloadSheet();
  } else {
    view_->refreshValues();
  }
}

std::string PropertySheetController::title() const {
  const auto shown = shown_.lock();
  if (!shown) {
    return "No Selection";
  }
  std::string name;
  if (const auto* layer = dynamic_cast<const Layer*>(shown.get())) {
    name = layer->name();
  } else if (const auto* camera = dynamic_cast<const Camera*>(shown.get())) {
    name = camera->name();
  }
  return name.empty() ? "Properties" : "Properties: " + name;
}

const PropertyField* PropertySheetController::fieldAt(std::size_t section,
                                                      std::size_t field) const {
  if (section >= sections_.size() || field >= sections_[section].fields.size()) {
    return nullptr;
  }
  return &sections_[section].fields[field];
}

Value PropertySheetController::valueAt(std::size_t section, std::size_t field) const {
  const PropertyField* f = fieldAt(section, field);
  return f != nullptr ? PropertySheet::readValue(sections_[section], *f) : Value{};
}

bool PropertySheetController::setValueAt(std::size_t section, std::size_t field,
                                         const Value& value) {
  const PropertyField* f = fieldAt(section, field);
  const auto doc = document();
  if (f == nullptr || !doc) {
    return false;
  }
  // Copies: the write reports the change, and the sheet must not be
  // rebuilt under the field being written.
  const PropertySection target = sections_[section];
  const PropertyField written = *f;
  writing_ = true;
  const bool ok = PropertySheet::writeValue(*doc, target, written, value);
  writing_ = false;
  update();
  return ok;
}

}  // namespace cloudreel
