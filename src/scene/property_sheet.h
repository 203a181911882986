#pragma once
// The property sheet: what the properties panel shows for the object being
// edited, described without any toolkit. An object yields sections (the
// common "Layer" settings, then those of its kind: "Point", "Primitive
// Properties", "Ocean", "Card", "Path", "SLERP", "Cameras", "Camera"),
// each a list of fields naming a key (or key path) of the object, a title,
// the kind of control and its range. Reading and writing go through key-value coding, so the
// sheet needs no code per property.
//
// A write is one undo step named after the field ("Change Point Size").
// Keys the document already observes on an attached layer (the name, the
// visibility, the point size, the primitive's shape, size, segments and
// colour, the translation of the placement) register their undo through
// that observation; every other key registers its own inverse here, so no
// edit is recorded twice. A layer's cached drawing is invalidated after
// every write and again after its undo or redo, then the document's
// hasChanged redraws the views.

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/value.h"

namespace cloudreel {

class MyDocument;
class Object;

enum class PropertyKind {
  Number,   // a float or double, with minimum, maximum, step and decimals
  Integer,  // a 32-bit int, with minimum, maximum and step
  Bool,
  Choice,  // a 32-bit int indexing `choices`
  Colour,  // a Color object
  Text,    // a string
};

struct PropertyField {
  std::string keyPath;  // "pointSize", or a path such as "frTranslate.x"
  std::string title;    // "Point Size"
  PropertyKind kind = PropertyKind::Number;
  double minimum = 0.0;
  double maximum = 1.0;
  double step = 1.0;
  int decimals = 2;
  std::vector<std::string> choices;
  bool readOnly = false;
  // The undo step's name: the action name the document observes the key
  // under, or "Change <title>".
  std::string actionName;
  // The document (or the object itself, for its placement) registers the
  // undo of this key while the object is attached to a document.
  bool observedForUndo = false;
};

struct PropertySection {
  std::string title;
  std::shared_ptr<Object> target;
  std::vector<PropertyField> fields;
};

class PropertySheet {
 public:
  // The sections for an object: a layer's common section first, then its
  // kind's; a camera's own section. Fields whose key the object does not
  // have are left out, so a subclass never shows a control that does
  // nothing. Null gives no sections.
  static std::vector<PropertySection> sectionsForObject(const std::shared_ptr<Object>& object);

  // The field's current value, converted to its kind (a double for
  // numbers, an int32 for integers and choices, a bool, a string, a colour
  // object). Null when the key cannot be read.
  static Value readValue(const PropertySection& section, const PropertyField& field);

  // Writes the value as one undo step on the document's undo manager (see
  // above), invalidates the layer's cached drawing and reports the change.
  // Numbers are clamped to the field's range; a not-a-number, a choice
  // outside the list, a value of the wrong kind or a read-only field is
  // refused and changes nothing (answers NO). Writing the value the
  // property already holds changes nothing and answers YES.
  static bool writeValue(MyDocument& document, const PropertySection& section,
                         const PropertyField& field, const Value& value);

  // The value a write would store, or nothing when it would be refused.
  static std::optional<Value> acceptedValue(const PropertyField& field, const Value& value);
};

}  // namespace cloudreel
