#include "platform/color.h"

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"

namespace cloudreel {

std::shared_ptr<Color> Color::colorWithRGBA(float red, float green, float blue, float alpha) {
  return std::make_shared<Color>(red, green, blue, alpha);
}

const PropertyTable& Color::properties() const {
  static const PropertyTable table(&Object::objectProperties(),
                                   {readOnlyProperty<Color>("red", &Color::red),
                                    readOnlyProperty<Color>("green", &Color::green),
                                    readOnlyProperty<Color>("blue", &Color::blue),
                                    readOnlyProperty<Color>("alpha", &Color::alpha)});
  return table;
}

void Color::encodeWithCoder(KeyedArchiver& coder) const {
  coder.encodeFloat(red_, "red");
  coder.encodeFloat(green_, "green");
  coder.encodeFloat(blue_, "blue");
  coder.encodeFloat(alpha_, "alpha");
}

void Color::initWithCoder(KeyedUnarchiver& coder) {
  red_ = coder.decodeFloatForKey("red");
  green_ = coder.decodeFloatForKey("green");
  blue_ = coder.decodeFloatForKey("blue");
  // A colour archived without alpha is opaque, not invisible.
  alpha_ = coder.containsValueForKey("alpha") ? coder.decodeFloatForKey("alpha") : 1.0f;
}

Bytes Color::archivedData() const {
  // A copy, because the archiver shares objects by owner and this colour may
  // not be owned by a shared_ptr.
  return KeyedArchiver::archivedDataWithRootObject(colorWithRGBA(red_, green_, blue_, alpha_));
}

std::shared_ptr<Color> Color::colorFromArchivedData(std::span<const std::uint8_t> data,
                                                    Error* error) {
  ObjectPtr root = KeyedUnarchiver::unarchiveObjectWithData(data, error);
  if (!root) {
    return nullptr;
  }
  auto color = std::dynamic_pointer_cast<Color>(root);
  if (!color) {
    setError(error, std::string(kArchiveErrorDomain), static_cast<int>(ArchiveError::WrongType),
             "the archive holds a " + std::string(root->className()) + ", not a Color");
  }
  return color;
}

}  // namespace cloudreel
