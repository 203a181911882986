#pragma once
// The boxed value that key-value coding, observation and undo pass around:
// null, a number of one of five kinds, a string or an object. Numbers convert
// between their kinds the way a boxed number does (a double read as a float
// narrows, a float read as an int truncates toward zero, any non-zero number
// reads as YES).

#include <cmath>
#include <concepts>
#include <cstdint>
#include <limits>
#include <memory>
#include <optional>
#include <string>
#include <type_traits>
#include <variant>

namespace cloudreel {

class Object;
using ObjectPtr = std::shared_ptr<Object>;

using Value = std::variant<std::monostate, bool, std::int32_t, std::int64_t, float, double,
                           std::string, ObjectPtr>;

inline bool isNull(const Value& value) {
  return std::holds_alternative<std::monostate>(value) ||
         (std::holds_alternative<ObjectPtr>(value) && !std::get<ObjectPtr>(value));
}

inline bool isNumber(const Value& value) {
  return std::holds_alternative<bool>(value) || std::holds_alternative<std::int32_t>(value) ||
         std::holds_alternative<std::int64_t>(value) || std::holds_alternative<float>(value) ||
         std::holds_alternative<double>(value);
}

// Converts a floating value to an integer type without undefined behaviour:
// truncation toward zero, not-a-number as 0, and values outside the range
// saturate at the type's limits.
template <std::integral I>
I saturatingCast(double v) {
  if (std::isnan(v)) {
    return 0;
  }
  if (v <= static_cast<double>(std::numeric_limits<I>::min())) {
    return std::numeric_limits<I>::min();
  }
  if (v >= static_cast<double>(std::numeric_limits<I>::max())) {
    return std::numeric_limits<I>::max();
  }
  return static_cast<I>(v);
}

// A double narrowed to float as IEEE rounding does, with values beyond the
// float range becoming infinities explicitly (a plain cast of such a value is
// undefined behaviour in C++).
inline float narrowToFloat(double v) {
  constexpr double kMax = static_cast<double>(std::numeric_limits<float>::max());
  if (v > kMax || v < -kMax) {
    // Values that round to the largest float still do so; only those past
    // the rounding boundary become infinite. A NaN falls through below.
    const double boundary = kMax + std::ldexp(1.0, 103);  // half an ulp above the largest float
    if (v >= boundary) {
      return std::numeric_limits<float>::infinity();
    }
    if (v <= -boundary) {
      return -std::numeric_limits<float>::infinity();
    }
    return v > 0 ? std::numeric_limits<float>::max() : -std::numeric_limits<float>::max();
  }
  return static_cast<float>(v);
}

// A number of any kind as the requested arithmetic type; empty for null,
// strings and objects.
template <typename T>
  requires std::is_arithmetic_v<T>
std::optional<T> numberAs(const Value& value) {
  return std::visit(
      [](const auto& v) -> std::optional<T> {
        using V = std::decay_t<decltype(v)>;
        if constexpr (std::is_same_v<V, std::monostate> || std::is_same_v<V, std::string> ||
                      std::is_same_v<V, ObjectPtr>) {
          return std::nullopt;
        } else if constexpr (std::is_same_v<T, bool>) {
          return v != V{};
        } else if constexpr (std::is_same_v<T, float> && std::is_same_v<V, double>) {
          return narrowToFloat(v);
        } else if constexpr (std::is_floating_point_v<T>) {
          return static_cast<T>(v);
        } else if constexpr (std::is_floating_point_v<V>) {
          return saturatingCast<T>(static_cast<double>(v));
        } else {
          // Integer to integer keeps the low bits, as a boxed number does.
          return static_cast<T>(v);
        }
      },
      value);
}

// The object held by a value, cast to the requested class; null when the value
// holds no object or an object of another class.
template <typename T>
std::shared_ptr<T> objectAs(const Value& value) {
  if (const auto* object = std::get_if<ObjectPtr>(&value)) {
    return std::dynamic_pointer_cast<T>(*object);
  }
  return nullptr;
}

}  // namespace cloudreel
