#include "scene/property_sheet.h"

#include <algorithm>
#include <cmath>
#include <string_view>
#include <utility>

#include "camera/camera.h"
#include "camera/camera_field.h"
#include "camera/camera_path.h"
#include "camera/discrete_camera_path.h"
#include "camera/scene_camera.h"
#include "camera/slerp_camera_path.h"
#include "platform/color.h"
#include "platform/log.h"
#include "scene/animated_card.h"
#include "scene/layer.h"
#include "scene/light_source.h"
#include "scene/my_document.h"
#include "scene/ocean_fft.h"
#include "scene/point_layer.h"
#include "scene/sphere.h"

namespace cloudreel {

namespace {

// --- field makers: the undo name is "Change <title>" unless the document
// observes the key under a name of its own.

PropertyField number(std::string key, std::string title, double minimum, double maximum,
                     double step, int decimals) {
  PropertyField f;
  f.keyPath = std::move(key);
  f.title = std::move(title);
  f.kind = PropertyKind::Number;
  f.minimum = minimum;
  f.maximum = maximum;
  f.step = step;
  f.decimals = decimals;
  f.actionName = "Change " + f.title;
  return f;
}

PropertyField integer(std::string key, std::string title, double minimum, double maximum) {
  PropertyField f = number(std::move(key), std::move(title), minimum, maximum, 1.0, 0);
  f.kind = PropertyKind::Integer;
  return f;
}

PropertyField boolean(std::string key, std::string title) {
  PropertyField f = number(std::move(key), std::move(title), 0.0, 1.0, 1.0, 0);
  f.kind = PropertyKind::Bool;
  return f;
}

PropertyField choice(std::string key, std::string title, std::vector<std::string> choices) {
  PropertyField f = number(std::move(key), std::move(title), 0.0,
                           static_cast<double>(choices.size()) - 1.0, 1.0, 0);
  f.kind = PropertyKind::Choice;
  f.choices = std::move(choices);
  return f;
}

PropertyField colour(std::string key, std::string title) {
  PropertyField f = number(std::move(key), std::move(title), 0.0, 1.0, 1.0, 0);
  f.kind = PropertyKind::Colour;
  return f;
}

PropertyField text(std::string key, std::string title) {
  PropertyField f = number(std::move(key), std::move(title), 0.0, 0.0, 1.0, 0);
  f.kind = PropertyKind::Text;
  return f;
}

PropertyField observed(PropertyField f, std::string actionName) {
  f.observedForUndo = true;
  f.actionName = std::move(actionName);
  return f;
}

PropertyField readOnly(PropertyField f) {
  f.readOnly = true;
  return f;
}

// The object holding the last key of a path, and that key; null when a
// step of the path is not an object.
std::pair<std::shared_ptr<Object>, std::string> ownerOfKeyPath(const std::shared_ptr<Object>& root,
                                                               std::string_view keyPath) {
  std::shared_ptr<Object> owner = root;
  std::size_t dot = 0;
  while (owner && (dot = keyPath.find('.')) != std::string_view::npos) {
    const std::string_view step = keyPath.substr(0, dot);
    if (owner->properties().find(step) == nullptr) {
      return {nullptr, {}};
    }
    owner = objectAs<Object>(owner->valueForKey(step));
    keyPath.remove_prefix(dot + 1);
  }
  return {owner, std::string(keyPath)};
}

bool hasKeyPath(const std::shared_ptr<Object>& object, const PropertyField& field) {
  const auto [owner, key] = ownerOfKeyPath(object, field.keyPath);
  if (!owner) {
    return false;
  }
  const Property* property = owner->properties().find(key);
  return property != nullptr && (field.readOnly || property->set != nullptr);
}

void addSection(std::vector<PropertySection>& sections, const std::shared_ptr<Object>& object,
                std::string title, std::vector<PropertyField> fields) {
  PropertySection section{std::move(title), object, {}};
  for (auto& field : fields) {
    if (hasKeyPath(object, field)) {
      section.fields.push_back(std::move(field));
    }
  }
  if (!section.fields.empty()) {
    sections.push_back(std::move(section));
  }
}

std::vector<PropertyField> layerFields() {
  return {observed(text("name", "Name"), "Change Name"),
          observed(boolean("isVisible", "Visible"), "Layer Visibility"),
          boolean("isInWorld", "In World"),
          number("billboardDistance", "Billboard Distance", 0.0, 1000.0, 0.1, 2),
          boolean("enableFog", "Fog")};
}

std::vector<PropertyField> pointFields(const PointLayer& layer) {
  std::vector<PropertyField> fields{
      observed(number("pointSize", "Point Size", 0.1, 64.0, 0.5, 1), "Change Point Size"),
      // Up to 1.004: only from there is a point of luck 255 drawn.
      number("bucketLimit", "Bucket Limit", 0.0, 1.004, 0.01, 3),
      number("opacity", "Opacity", 0.0, 1.0, 0.05, 2),
      choice("colorMode", "Colour Mode", {"Point Colours", "Fixed Colour"}),
      colour("fixedColor", "Fixed Colour"), choice("drawMode", "Draw Mode", {"Points", "Spheres"}),
      boolean("antialias", "Smooth Points"), boolean("attenuatePoints", "Attenuate With Distance"),
      number("atten_a", "Attenuation Constant", 0.0, 100.0, 0.01, 4),
      number("atten_b", "Attenuation Linear", 0.0, 100.0, 0.01, 4),
      number("atten_c", "Attenuation Quadratic", 0.0, 100.0, 0.01, 4),
      boolean("drawBoundingBox", "Bounding Box")};
  // The mesh settings only mean something for a layer with triangles.
  if (layer.nFaces() > 0) {
    fields.push_back(boolean("drawPointsOnly", "Points Only"));
    fields.push_back(boolean("drawWireFrame", "Wireframe"));
  }
  fields.push_back(readOnly(integer("nPoints", "Points", 0.0, 2147483647.0)));
  return fields;
}

std::vector<PropertyField> primitiveFields() {
  return {observed(choice("shape", "Shape",
                          {"Sphere", "Cube", "Teapot", "Cone", "Plane", "Wire Sphere"}),
                   "Change Shape"),
          observed(number("size", "Size", 0.001, 1000.0, 0.1, 3), "Change Size"),
          observed(integer("segments", "Segments", 3.0, 256.0), "Change Segments"),
          observed(colour("color", "Colour"), "Change Colour")};
}

std::vector<PropertyField> oceanFields() {
  // The grid takes powers of two only: the layer moves any other number to
  // the nearest one.
  return {observed(
              integer("gridSize", "Grid", OceanSpectrum::kMinGridSize, OceanSpectrum::kMaxGridSize),
              "Change Grid Size"),
          observed(number("patchSize", "Tile Size", 0.1, 10000.0, 1.0, 1), "Change Patch Size"),
          observed(number("windSpeed", "Wind Speed", 0.0, 100.0, 0.5, 1), "Change Wind Speed"),
          observed(number("windDirection", "Wind Direction", -360.0, 360.0, 5.0, 0),
                   "Change Wind Direction"),
          observed(number("amplitude", "Amplitude", 0.0, 1.0, 0.0005, 4), "Change Amplitude"),
          observed(number("choppiness", "Choppiness", 0.0, 5.0, 0.1, 2), "Change Choppiness"),
          observed(integer("seed", "Seed", 0.0, 2147483647.0), "Change Seed"),
          number("time", "Time", -1.0e6, 1.0e6, 0.04, 2),
          observed(colour("fixedColor", "Colour"), "Change Colour"),
          observed(boolean("drawWireFrame", "Wireframe"), "Wireframe"),
          readOnly(integer("nPoints", "Vertices", 0.0, 2147483647.0))};
}

std::vector<PropertyField> cardFields() {
  return {observed(text("imagePath", "Picture"), "Change Picture"),
          readOnly(text("sourceError", "Problem")),
          observed(number("cardHeight", "Height", 0.0, 10000.0, 0.1, 3), "Change Size"),
          observed(number("opacity", "Opacity", 0.0, 1.0, 0.05, 2), "Change Opacity"),
          observed(integer("FPS", "Frame Rate", 1.0, 1000.0), "Change Frame Rate"),
          observed(integer("frameOffset", "Frame Offset", -1.0e6, 1.0e6), "Change Frame Offset"),
          readOnly(integer("nFrames", "Frames", 0.0, 2147483647.0))};
}

std::vector<PropertyField> positionFields(const std::string& prefix) {
  std::vector<PropertyField> fields;
  for (const char* axis : {"X", "Y", "Z"}) {
    fields.push_back(
        observed(number(prefix + axis, std::string("Position ") + axis, -1.0e6, 1.0e6, 0.1, 3),
                 "Translate"));
  }
  return fields;
}

std::vector<PropertyField> pathFields(const CameraPath& path) {
  const bool framesAreEditable = dynamic_cast<const SLERPCameraPath*>(&path) != nullptr;
  PropertyField frames = integer("nFrames", "Frames", 1.0, 1000000.0);
  std::vector<PropertyField> fields{
      integer("fps", "Frames Per Second", 1.0, 240.0),
      // A stored path's records and a field's cameras fix its frame count.
      framesAreEditable ? frames : readOnly(frames),
      integer("currentFrame", "Current Frame", 0.0, std::max(0, path.nFrames() - 1)),
      readOnly(text("durationAsFormattedString", "Duration")),
      number("translateGain", "Translate Gain", -1000.0, 1000.0, 0.1, 3),
      boolean("invert", "Invert"), boolean("interpolate", "Interpolate")};
  return fields;
}

std::vector<PropertyField> slerpFields() {
  std::vector<PropertyField> fields;
  const std::pair<const char*, const char*> vectors[] = {{"frTranslate", "From Position "},
                                                         {"frRotate", "From Rotation "},
                                                         {"toTranslate", "To Position "},
                                                         {"toRotate", "To Rotation "}};
  for (const auto& [key, title] : vectors) {
    const bool rotation = std::string_view(key).ends_with("Rotate");
    for (const char* axis : {"x", "y", "z"}) {
      fields.push_back(number(std::string(key) + "." + axis,
                              title + std::string(1, static_cast<char>(axis[0] - 'a' + 'A')),
                              rotation ? -360.0 : -1.0e6, rotation ? 360.0 : 1.0e6,
                              rotation ? 1.0 : 0.1, 3));
    }
  }
  return fields;
}

std::vector<PropertyField> cameraFieldFields() {
  return {boolean("drawFrustum", "Draw Frustums"),
          number("frustumLength", "Frustum Length", 0.0, 1000.0, 0.1, 2),
          number("imageOpacity", "Image Opacity", 0.0, 1.0, 0.05, 2),
          boolean("variableOpacity", "Variable Opacity"),
          number("variableExponent", "Variable Exponent", 0.0, 100.0, 0.1, 2)};
}

std::vector<PropertyField> cameraFields(const Camera& camera) {
  std::vector<PropertyField> fields{text("name", "Name"),
                                    number("fieldOfView", "Field Of View", 1.0, 179.0, 1.0, 1),
                                    number("zNear", "Near Z Plane", 0.001, 1.0e5, 0.1, 3),
                                    number("zFar", "Far Z Plane", 0.001, 1.0e6, 1.0, 3)};
  for (const char* axis : {"X", "Y", "Z"}) {
    fields.push_back(number(std::string("position") + axis, std::string("Position ") + axis, -1.0e6,
                            1.0e6, 0.1, 3));
  }
  if (dynamic_cast<const SceneCamera*>(&camera) != nullptr) {
    fields.push_back(number("heading", "Heading", -360.0, 360.0, 1.0, 1));
    fields.push_back(number("pitch", "Pitch", -360.0, 360.0, 1.0, 1));
    fields.push_back(number("bank", "Bank", -360.0, 360.0, 1.0, 1));
  }
  return fields;
}

bool sameValue(const PropertyField& field, const Value& a, const Value& b) {
  switch (field.kind) {
    case PropertyKind::Number: {
      // Properties hold floats: equal once narrowed, equal in effect.
      const auto x = numberAs<double>(a);
      const auto y = numberAs<double>(b);
      return x && y && narrowToFloat(*x) == narrowToFloat(*y);
    }
    case PropertyKind::Colour: {
      const auto x = objectAs<Color>(a);
      const auto y = objectAs<Color>(b);
      return x && y && *x == *y;
    }
    default:
      return a == b;
  }
}

void invalidateDrawing(Object& object) {
  if (auto* layer = dynamic_cast<Layer*>(&object)) {
    layer->invalidateOpenGLDisplayLists();
  }
}

// An undo entry that drops the layer's cached drawing when the step is
// undone or redone: the document's own undo of an observed key only sets
// the value back, and some setters (the primitive's shape) leave the cache
// as it was. It re-registers itself so the redo does the same.
void registerInvalidation(MyDocument& document, const std::weak_ptr<Object>& target) {
  document.undoManager().registerUndoWithTarget(&document, [&document, target] {
    if (const auto object = target.lock()) {
      invalidateDrawing(*object);
      registerInvalidation(document, target);
      document.hasChanged();
    }
  });
}

// Sets the value and registers the inverse under the action name; the
// inverse does the same, so undo and redo alternate without end.
void setWithOwnUndo(MyDocument& document, const std::weak_ptr<Object>& target,
                    const std::string& keyPath, const Value& value, const std::string& actionName) {
  const auto object = target.lock();
  if (!object) {
    return;
  }
  const Value old = object->valueForKeyPath(keyPath);
  document.undoManager().registerUndoWithTarget(
      &document, [&document, target, keyPath, old, actionName] {
        setWithOwnUndo(document, target, keyPath, old, actionName);
      });
  document.undoManager().setActionName(actionName);
  object->setValueForKeyPath(value, keyPath);
  invalidateDrawing(*object);
  document.hasChanged();
}

// Whether setting the key registers its undo by observation: the field is
// one the document (or the object, for its placement) observes, the
// object is attached to this document, and the observation is in place
// (placements decoded from a file are not observed until replaced).
bool undoIsObserved(MyDocument& document, const PropertySection& section,
                    const PropertyField& field) {
  if (!field.observedForUndo) {
    return false;
  }
  const auto* animatable = dynamic_cast<const Animatable3DObject*>(section.target.get());
  if (animatable == nullptr || animatable->document() != &document) {
    return false;
  }
  const auto [owner, key] = ownerOfKeyPath(section.target, field.keyPath);
  return owner && owner->isObservedForKey(key);
}

}  // namespace

std::vector<PropertySection> PropertySheet::sectionsForObject(
    const std::shared_ptr<Object>& object) {
  std::vector<PropertySection> sections;
  if (const auto camera = std::dynamic_pointer_cast<Camera>(object)) {
    addSection(sections, object, "Camera", cameraFields(*camera));
    return sections;
  }
  const auto layer = std::dynamic_pointer_cast<Layer>(object);
  if (!layer) {
    return sections;
  }
  addSection(sections, object, "Layer", layerFields());
  if (std::dynamic_pointer_cast<OceanFFT>(layer)) {
    addSection(sections, object, "Ocean", oceanFields());
  } else if (std::dynamic_pointer_cast<AnimatedCard>(layer)) {
    addSection(sections, object, "Card", cardFields());
  } else if (const auto points = std::dynamic_pointer_cast<PointLayer>(layer)) {
    addSection(sections, object, "Point", pointFields(*points));
  } else if (std::dynamic_pointer_cast<Sphere>(layer)) {
    addSection(sections, object, "Primitive Properties", primitiveFields());
  } else if (std::dynamic_pointer_cast<LightSource>(layer)) {
    addSection(sections, object, "Light", positionFields("objectToWorld.translation"));
  } else if (const auto path = std::dynamic_pointer_cast<CameraPath>(layer)) {
    addSection(sections, object, "Path", pathFields(*path));
    if (std::dynamic_pointer_cast<SLERPCameraPath>(layer)) {
      addSection(sections, object, "SLERP", slerpFields());
    } else if (std::dynamic_pointer_cast<CameraField>(layer)) {
      addSection(sections, object, "Cameras", cameraFieldFields());
    }
  }
  return sections;
}

Value PropertySheet::readValue(const PropertySection& section, const PropertyField& field) {
  if (!section.target) {
    return Value{};
  }
  const Value raw = section.target->valueForKeyPath(field.keyPath);
  switch (field.kind) {
    case PropertyKind::Number:
      if (const auto v = numberAs<double>(raw)) {
        return *v;
      }
      return Value{};
    case PropertyKind::Integer:
    case PropertyKind::Choice:
      if (const auto v = numberAs<std::int32_t>(raw)) {
        return *v;
      }
      return Value{};
    case PropertyKind::Bool:
      if (const auto v = numberAs<bool>(raw)) {
        return *v;
      }
      return Value{};
    case PropertyKind::Colour:
      return objectAs<Color>(raw) ? raw : Value{};
    case PropertyKind::Text:
      return std::holds_alternative<std::string>(raw) ? raw : Value{};
  }
  return Value{};
}

std::optional<Value> PropertySheet::acceptedValue(const PropertyField& field, const Value& value) {
  if (field.readOnly) {
    return std::nullopt;
  }
  switch (field.kind) {
    case PropertyKind::Number: {
      const auto v = numberAs<double>(value);
      if (!v || std::isnan(*v)) {
        return std::nullopt;
      }
      return std::clamp(*v, field.minimum, field.maximum);
    }
    case PropertyKind::Integer: {
      const auto v = numberAs<double>(value);
      if (!v || std::isnan(*v)) {
        return std::nullopt;
      }
      return saturatingCast<std::int32_t>(std::clamp(std::trunc(*v), field.minimum, field.maximum));
    }
    case PropertyKind::Choice: {
      const auto v = numberAs<double>(value);
      if (!v || std::isnan(*v) || *v < 0.0 || *v >= static_cast<double>(field.choices.size())) {
        return std::nullopt;
      }
      return static_cast<std::int32_t>(*v);
    }
    case PropertyKind::Bool:
      if (!isNumber(value)) {
        return std::nullopt;
      }
      return numberAs<bool>(value).value_or(false);
    case PropertyKind::Colour:
      if (!objectAs<Color>(value)) {
        return std::nullopt;
      }
      return value;
    case PropertyKind::Text:
      if (!std::holds_alternative<std::string>(value)) {
        return std::nullopt;
      }
      return value;
  }
  return std::nullopt;
}

bool PropertySheet::writeValue(MyDocument& document, const PropertySection& section,
                               const PropertyField& field, const Value& value) {
  const std::optional<Value> accepted = acceptedValue(field, value);
  if (!accepted || !section.target || !hasKeyPath(section.target, field)) {
    logf("the property sheet refused \"%s\" for \"%s\"", field.title, field.keyPath);
    return false;
  }
  if (sameValue(field, readValue(section, field), *accepted)) {
    return true;
  }
  const std::weak_ptr<Object> target = section.target;
  registerInvalidation(document, target);
  if (undoIsObserved(document, section, field)) {
    section.target->setValueForKeyPath(*accepted, field.keyPath);
    invalidateDrawing(*section.target);
    document.hasChanged();
  } else {
    setWithOwnUndo(document, target, field.keyPath, *accepted, field.actionName);
  }
  return true;
}

}  // namespace cloudreel
