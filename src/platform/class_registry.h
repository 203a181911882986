#pragma once
// Maps the class names recorded in archives to factories that make a blank
// object for initWithCoder to fill. Decoding makes only classes registered
// here, so a document cannot ask for anything else.

#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>

#include "platform/value.h"

namespace cloudreel {

class ClassRegistry {
 public:
  ClassRegistry() = default;
  ClassRegistry(const ClassRegistry&) = delete;
  ClassRegistry& operator=(const ClassRegistry&) = delete;

  // The process-wide registry. The platform's own archivable classes (Color)
  // are registered in it when it is first used.
  static ClassRegistry& shared();

  // Registering a name again replaces its factory.
  void registerClass(std::string name, std::function<ObjectPtr()> factory);
  template <class T>
  void registerClass(std::string name) {
    registerClass(std::move(name), [] { return ObjectPtr(std::make_shared<T>()); });
  }

  // A blank object of the named class; null for a name never registered.
  ObjectPtr make(std::string_view name) const;
  bool contains(std::string_view name) const;

 private:
  // Documents may be read on a background thread while the main thread
  // registers the classes of a plug-in.
  mutable std::mutex mutex_;
  std::map<std::string, std::function<ObjectPtr()>, std::less<>> factories_;
};

}  // namespace cloudreel
