#include "platform/class_registry.h"

#include "platform/color.h"

namespace cloudreel {

ClassRegistry& ClassRegistry::shared() {
  static ClassRegistry* registry = [] {
    auto* r = new ClassRegistry;  // never destroyed: objects may be decoded during exit
    r->registerClass<Color>("Color");
    return r;
  }();
  return *registry;
}

void ClassRegistry::registerClass(std::string name, std::function<ObjectPtr()> factory) {
  std::lock_guard lock(mutex_);
  factories_.insert_or_assign(std::move(name), std::move(factory));
}

ObjectPtr ClassRegistry::make(std::string_view name) const {
  std::function<ObjectPtr()> factory;
  {
    std::lock_guard lock(mutex_);
    auto found = factories_.find(name);
    if (found == factories_.end()) {
      return nullptr;
    }
    factory = found->second;
  }
  // Called outside the lock: a factory may itself consult the registry.
  return factory ? factory() : nullptr;
}

bool ClassRegistry::contains(std::string_view name) const {
  std::lock_guard lock(mutex_);
  return factories_.find(name) != factories_.end();
}

}  // namespace cloudreel
