#pragma once
// An RGBA colour with float components in 0..1, the value the scene's layers,
// lights and backgrounds are painted with. Colours are values: immutable once
// made, compared by their components, and archived as a "Color" object with
// the float32 keys "red", "green", "blue" and "alpha". Layers keep a colour
// as a nested archive, a byte string holding a complete archive of it.

#include <memory>
#include <span>
#include <string_view>

#include "platform/byte_stream.h"
#include "platform/error.h"
#include "platform/object.h"

namespace cloudreel {

class Color final : public Object {
 public:
  // Opaque black; also the blank object that initWithCoder fills.
  Color() = default;
  Color(float red, float green, float blue, float alpha = 1.0f)
      : red_(red), green_(green), blue_(blue), alpha_(alpha) {}

  static std::shared_ptr<Color> colorWithRGBA(float red, float green, float blue,
                                              float alpha = 1.0f);

  float red() const { return red_; }
  float green() const { return green_; }
  float blue() const { return blue_; }
  float alpha() const { return alpha_; }

  friend bool operator==(const Color& a, const Color& b) {
    return a.red_ == b.red_ && a.green_ == b.green_ && a.blue_ == b.blue_ &&
           a.alpha_ == b.alpha_;
  }

  // A complete archive with this colour as its root object.
  Bytes archivedData() const;
  // Null, with the error, when the data is not an archive whose root is a colour.
  static std::shared_ptr<Color> colorFromArchivedData(std::span<const std::uint8_t> data,
                                                      Error* error);

  std::string_view className() const override { return "Color"; }
  const PropertyTable& properties() const override;
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 private:
  float red_ = 0.0f;
  float green_ = 0.0f;
  float blue_ = 0.0f;
  float alpha_ = 1.0f;
};

}  // namespace cloudreel
