#pragma once
// The root of every model class: properties reachable by key (key-value
// coding), observation of those keys with old and new values and a context,
// and the hooks of the keyed archive.
//
// Model objects are shared through std::shared_ptr; back-pointers (a layer's
// document, a track's animated object) are plain non-owning pointers.

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

#include "platform/value.h"

namespace cloudreel {

class KeyedArchiver;
class KeyedUnarchiver;
class Object;

// ---------------------------------------------------------------------------
// Observation

enum class ObservingOptions : unsigned {
  None = 0,
  New = 1u << 0,      // the change carries the new value
  Old = 1u << 1,      // the change carries the value before the change
  Initial = 1u << 2,  // one notification at registration, with the current value as new
  Prior = 1u << 3,    // one extra notification before the change, marked isPrior
};

constexpr ObservingOptions operator|(ObservingOptions a, ObservingOptions b) {
  return static_cast<ObservingOptions>(static_cast<unsigned>(a) | static_cast<unsigned>(b));
}
constexpr bool hasOption(ObservingOptions set, ObservingOptions option) {
  return (static_cast<unsigned>(set) & static_cast<unsigned>(option)) != 0;
}

struct Change {
  std::optional<Value> oldValue;
  std::optional<Value> newValue;
  bool isPrior = false;
};

// Anything that observes keys or receives notifications. Registrations keep
// only a weak token of the observer, so an observer that is destroyed while
// still registered is never called: its registrations are dropped when next
// met.
class Observer {
 public:
  Observer() = default;
  Observer(const Observer&) {}  // a copy is a new observer with its own lifetime
  Observer& operator=(const Observer&) { return *this; }
  virtual ~Observer() = default;

  virtual void observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath,
                                                           Object& object,
                                                           const Change& change,
                                                           std::string_view context);

  std::weak_ptr<const void> lifetimeToken() const { return lifetime_; }

 private:
  std::shared_ptr<const int> lifetime_ = std::make_shared<const int>(0);
};

// An observer that forwards to a callable; handy for panels and tests.
class CallbackObserver : public Observer {
 public:
  using Callback =
      std::function<void(std::string_view keyPath, Object& object, const Change& change,
                         std::string_view context)>;
  explicit CallbackObserver(Callback callback) : callback_(std::move(callback)) {}
  void observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath, Object& object,
                                                   const Change& change,
                                                   std::string_view context) override {
    callback_(keyPath, object, change, context);
  }

 private:
  Callback callback_;
};

// ---------------------------------------------------------------------------
// Property tables

// One property of a class: its key, a getter and (unless read-only) a setter.
// The setter answers NO when the value cannot be converted to the property's
// type, and then changes nothing.
struct Property {
  std::string_view key;
  std::function<Value(const Object&)> get;
  std::function<bool(Object&, const Value&)> set;
};

// The properties a class declares, chained to its base class's table.
class PropertyTable {
 public:
  PropertyTable(const PropertyTable* base, std::vector<Property> properties)
      : base_(base), properties_(std::move(properties)) {}

  const Property* find(std::string_view key) const;
  // Every key of the class and its bases, bases first.
  std::vector<std::string_view> keys() const;

 private:
  const PropertyTable* base_;
  std::vector<Property> properties_;
};

namespace detail {

template <typename T>
Value toValue(const T& v) {
  if constexpr (std::is_same_v<T, bool> || std::is_same_v<T, std::int32_t> ||
                std::is_same_v<T, std::int64_t> || std::is_same_v<T, float> ||
                std::is_same_v<T, double> || std::is_same_v<T, std::string>) {
    return v;
  } else if constexpr (std::is_enum_v<T>) {
    return static_cast<std::int32_t>(v);
  } else if constexpr (std::is_integral_v<T> && sizeof(T) <= 4 && std::is_signed_v<T>) {
    return static_cast<std::int32_t>(v);
  } else if constexpr (std::is_integral_v<T>) {
    return static_cast<std::int64_t>(v);
  } else {
    // A std::shared_ptr to some Object subclass.
    return ObjectPtr(v);
  }
}

template <typename T>
std::optional<T> fromValue(const Value& value) {
  if constexpr (std::is_same_v<T, std::string>) {
    if (const auto* s = std::get_if<std::string>(&value)) {
      return *s;
    }
    return std::nullopt;
  } else if constexpr (std::is_enum_v<T>) {
    if (auto n = numberAs<std::int32_t>(value)) {
      return static_cast<T>(*n);
    }
    return std::nullopt;
  } else if constexpr (std::is_arithmetic_v<T>) {
    return numberAs<T>(value);
  } else {
    using Element = typename T::element_type;
    if (isNull(value)) {
      return T{};
    }
    if (auto object = objectAs<Element>(value)) {
      return object;
    }
    return std::nullopt;
  }
}

}  // namespace detail

// A property from a class's getter and setter member functions, e.g.
// property<PointLayer>("pointSize", &PointLayer::pointSize, &PointLayer::setPointSize).
template <typename C, typename Getter, typename Setter>
Property property(std::string_view key, Getter getter, Setter setter) {
  using T = std::decay_t<std::invoke_result_t<Getter, const C&>>;
  return Property{
      key,
      [getter](const Object& object) {
        return detail::toValue<T>(std::invoke(getter, static_cast<const C&>(object)));
      },
      [setter](Object& object, const Value& value) {
        std::optional<T> converted = detail::fromValue<T>(value);
        if (!converted) {
          return false;
        }
        std::invoke(setter, static_cast<C&>(object), std::move(*converted));
        return true;
      }};
}

// The same, for a class whose setter is silent when called directly (the
// owner announces such changes itself) but whose key-value-coding set must
// still be observed: the set is bracketed by will/did-change of the key, as
// for any observable property set by key.
template <typename C, typename Getter, typename Setter>
Property notifyingProperty(std::string_view key, Getter getter, Setter setter) {
  using T = std::decay_t<std::invoke_result_t<Getter, const C&>>;
  Property p = property<C>(key, getter, setter);
  p.set = [key, setter](Object& object, const Value& value) {
    std::optional<T> converted = detail::fromValue<T>(value);
    if (!converted) {
      return false;
    }
    C& target = static_cast<C&>(object);
    target.willChangeValueForKey(key);
    std::invoke(setter, target, std::move(*converted));
    target.didChangeValueForKey(key);
    return true;
  };
  return p;
}

template <typename C, typename Getter>
Property readOnlyProperty(std::string_view key, Getter getter) {
  using T = std::decay_t<std::invoke_result_t<Getter, const C&>>;
  return Property{key,
                  [getter](const Object& object) {
                    return detail::toValue<T>(std::invoke(getter, static_cast<const C&>(object)));
                  },
                  nullptr};
}

// ---------------------------------------------------------------------------
// Object

class Object : public std::enable_shared_from_this<Object> {
 public:
  Object();
  virtual ~Object();
  // Model objects are copied by their own copy operations, never implicitly:
  // a copy must not take over the original's observers.
  Object(const Object&) = delete;
  Object& operator=(const Object&) = delete;

  // The class name recorded in archives ("Layer", "PointLayer", ...).
  virtual std::string_view className() const { return "Object"; }

  // The class's property table; subclasses chain theirs to their base's.
  virtual const PropertyTable& properties() const;
  static const PropertyTable& objectProperties();

  // --- key-value coding
  // Unknown keys are logged and answer null; setting an unknown key, a
  // read-only key or a value of an unconvertible type is logged, changes
  // nothing and answers NO.
  Value valueForKey(std::string_view key) const;
  bool setValueForKey(const Value& value, std::string_view key);
  // Dotted paths walk through object-valued properties ("objectToWorld.scaleX").
  Value valueForKeyPath(std::string_view keyPath) const;
  bool setValueForKeyPath(const Value& value, std::string_view keyPath);

  // --- observation
  void addObserver(Observer& observer, std::string key, ObservingOptions options,
                   std::string context);
  // Removes the latest registration of this observer for the key; removing
  // one that does not exist does nothing.
  void removeObserver(Observer& observer, std::string_view key);
  void willChangeValueForKey(std::string_view key);
  void didChangeValueForKey(std::string_view key);
  bool isObservedForKey(std::string_view key) const;

  // --- keyed archiving: a class writes its state under its keys and reads it
  // back into an object made by its registered factory.
  virtual void encodeWithCoder(KeyedArchiver& coder) const;
  virtual void initWithCoder(KeyedUnarchiver& coder);

 protected:
  // Stores a new value into a member with will/did-change notifications,
  // the common shape of an observable setter.
  template <typename T, typename U>
  void changeValueForKey(std::string_view key, T& member, U&& value) {
    willChangeValueForKey(key);
    member = std::forward<U>(value);
    didChangeValueForKey(key);
  }

 private:
  struct Observation;
  std::unique_ptr<Observation> observation_;
};

}  // namespace cloudreel
