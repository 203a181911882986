#include "platform/object.h"

#include <algorithm>

#include "platform/log.h"

namespace cloudreel {

void Observer::observeValueForKeyPathOfObjectChangeContext(std::string_view, Object&,
                                                           const Change&, std::string_view) {}

const Property* PropertyTable::find(std::string_view key) const {
  for (const PropertyTable* table = this; table != nullptr; table = table->base_) {
    for (const Property& p : table->properties_) {
      if (p.key == key) {
        return &p;
      }
    }
  }
  return nullptr;
}

std::vector<std::string_view> PropertyTable::keys() const {
  std::vector<std::string_view> result = base_ != nullptr ? base_->keys() : std::vector<std::string_view>{};
  for (const Property& p : properties_) {
    result.push_back(p.key);
  }
  return result;
}

// Observation state, made when an object is first observed.
struct Object::Observation {
  struct Registration {
    std::uint64_t id;
    std::string key;
    Observer* observer;
    std::weak_ptr<const void> alive;
    ObservingOptions options;
    std::string context;
  };
  // A will-change waiting for its did-change; nested changes of one key pair
  // up innermost first.
  struct Pending {
    std::string key;
    std::optional<Value> oldValue;
  };

  std::vector<Registration> registrations;
  std::vector<Pending> pending;
  std::uint64_t nextId = 1;

  void pruneDead() {
    std::erase_if(registrations, [](const Registration& r) { return r.alive.expired(); });
  }
  bool contains(std::uint64_t id) const {
    return std::any_of(registrations.begin(), registrations.end(),
                       [id](const Registration& r) { return r.id == id; });
  }
  std::vector<Registration> registrationsFor(std::string_view key) const {
    std::vector<Registration> result;
    for (const Registration& r : registrations) {
      if (r.key == key && !r.alive.expired()) {
        result.push_back(r);
      }
    }
    return result;
  }
};

Object::Object() = default;
Object::~Object() = default;

const PropertyTable& Object::objectProperties() {
  static const PropertyTable table(nullptr, {});
  return table;
}

const PropertyTable& Object::properties() const { return objectProperties(); }

Value Object::valueForKey(std::string_view key) const {
  if (const Property* p = properties().find(key)) {
    return p->get(*this);
  }
  logf("valueForKey: %s has no key \"%s\"", std::string(className()), std::string(key));
  return {};
}

bool Object::setValueForKey(const Value& value, std::string_view key) {
  const Property* p = properties().find(key);
  if (p == nullptr) {
    logf("setValueForKey: %s has no key \"%s\"", std::string(className()), std::string(key));
    return false;
  }
  if (!p->set) {
    logf("setValueForKey: key \"%s\" of %s is read-only", std::string(key),
         std::string(className()));
    return false;
  }
  if (!p->set(*this, value)) {
    logf("setValueForKey: value of the wrong type for key \"%s\" of %s", std::string(key),
         std::string(className()));
    return false;
  }
  return true;
}

namespace {

// Splits "a.b.c" into the object path "a.b" and the last key "c".
std::pair<std::string_view, std::string_view> splitLastKey(std::string_view keyPath) {
  const auto dot = keyPath.rfind('.');
  if (dot == std::string_view::npos) {
    return {{}, keyPath};
  }
  return {keyPath.substr(0, dot), keyPath.substr(dot + 1)};
}

}  // namespace

Value Object::valueForKeyPath(std::string_view keyPath) const {
  const auto [path, key] = splitLastKey(keyPath);
  if (path.empty()) {
    return valueForKey(key);
  }
  const ObjectPtr holder = objectAs<Object>(valueForKeyPath(path));
  return holder ? holder->valueForKey(key) : Value{};
}

bool Object::setValueForKeyPath(const Value& value, std::string_view keyPath) {
  const auto [path, key] = splitLastKey(keyPath);
  if (path.empty()) {
    return setValueForKey(value, key);
  }
  const ObjectPtr holder = objectAs<Object>(valueForKeyPath(path));
  return holder ? holder->setValueForKey(value, key) : false;
}

void Object::addObserver(Observer& observer, std::string key, ObservingOptions options,
                         std::string context) {
  if (!observation_) {
    observation_ = std::make_unique<Observation>();
  }
  observation_->pruneDead();
  const std::uint64_t id = observation_->nextId++;
  observation_->registrations.push_back(
      {id, key, &observer, observer.lifetimeToken(), options, context});
  if (hasOption(options, ObservingOptions::Initial)) {
    Change change;
    if (hasOption(options, ObservingOptions::New)) {
      change.newValue = valueForKey(key);
    }
    observer.observeValueForKeyPathOfObjectChangeContext(key, *this, change, context);
  }
}

void Object::removeObserver(Observer& observer, std::string_view key) {
  if (!observation_) {
    return;
  }
  auto& regs = observation_->registrations;
  for (auto it = regs.rbegin(); it != regs.rend(); ++it) {
    if (it->observer == &observer && it->key == key && !it->alive.expired()) {
      regs.erase(std::next(it).base());
      return;
    }
  }
}

bool Object::isObservedForKey(std::string_view key) const {
  return observation_ && !observation_->registrationsFor(key).empty();
}

void Object::willChangeValueForKey(std::string_view key) {
  if (!observation_) {
    return;
  }
  const auto regs = observation_->registrationsFor(key);
  if (regs.empty()) {
    return;
  }
  const bool wantsOld = std::any_of(regs.begin(), regs.end(), [](const auto& r) {
    return hasOption(r.options, ObservingOptions::Old);
  });
  Observation::Pending pending{std::string(key), std::nullopt};
  if (wantsOld) {
    pending.oldValue = valueForKey(key);
  }
  observation_->pending.push_back(pending);

  // Keep this object alive while observers run, when it is shared-owned.
  const auto self = weak_from_this().lock();
  for (const auto& r : regs) {
    if (!hasOption(r.options, ObservingOptions::Prior)) {
      continue;
    }
    const auto alive = r.alive.lock();
    if (!alive || !observation_->contains(r.id)) {
      continue;
    }
    Change change;
    change.isPrior = true;
    if (hasOption(r.options, ObservingOptions::Old)) {
      change.oldValue = pending.oldValue;
    }
    r.observer->observeValueForKeyPathOfObjectChangeContext(key, *this, change, r.context);
  }
}

void Object::didChangeValueForKey(std::string_view key) {
  if (!observation_) {
    return;
  }
  // Pair with the innermost will-change of this key. A did-change without a
  // will-change (or one whose observers registered in between) still
  // notifies, just without an old value.
  std::optional<Value> oldValue;
  auto& pending = observation_->pending;
  for (auto it = pending.rbegin(); it != pending.rend(); ++it) {
    if (it->key == key) {
      oldValue = std::move(it->oldValue);
      pending.erase(std::next(it).base());
      break;
    }
  }
  const auto regs = observation_->registrationsFor(key);
  if (regs.empty()) {
    return;
  }
  const bool wantsNew = std::any_of(regs.begin(), regs.end(), [](const auto& r) {
    return hasOption(r.options, ObservingOptions::New);
  });
  const std::optional<Value> newValue =
      wantsNew ? std::optional<Value>(valueForKey(key)) : std::nullopt;

  const auto self = weak_from_this().lock();
  for (const auto& r : regs) {
    const auto alive = r.alive.lock();
    // An observer removed by an earlier callback of this same change is not
    // called any more.
    if (!alive || !observation_->contains(r.id)) {
      continue;
    }
    Change change;
    if (hasOption(r.options, ObservingOptions::Old)) {
      change.oldValue = oldValue ? *oldValue : Value{};
    }
    if (hasOption(r.options, ObservingOptions::New)) {
      change.newValue = newValue;
    }
    r.observer->observeValueForKeyPathOfObjectChangeContext(key, *this, change, r.context);
  }
}

void Object::encodeWithCoder(KeyedArchiver&) const {}
void Object::initWithCoder(KeyedUnarchiver&) {}

}  // namespace cloudreel
