#pragma once
// Archive round trips for the scene tests, through the real keyed archive
// with every scene class registered.

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <string_view>

#include "platform/class_registry.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "scene/core_classes.h"

namespace cloudreel::testing {

// Decodes archived data as the class T; null (and a test failure) when the
// data does not decode to one.
template <class T>
std::shared_ptr<T> decodeAs(const Bytes& data) {
  registerCoreClasses(ClassRegistry::shared());
  Error error;
  auto object = KeyedUnarchiver::unarchiveObjectWithData(data, &error);
  EXPECT_TRUE(object) << error.message;
  return std::dynamic_pointer_cast<T>(object);
}

template <class T>
std::shared_ptr<T> roundTrip(const std::shared_ptr<T>& object) {
  return decodeAs<T>(KeyedArchiver::archivedDataWithRootObject(object));
}

// Archives a stand-in that writes only what `write` writes, under the class
// name `className`, and reads it back as the real class: how an older or a
// damaged document reads.
template <class T>
std::shared_ptr<T> decodeFrom(std::string_view className,
                              std::function<void(KeyedArchiver&)> write) {
  class Partial : public Object {
   public:
    Partial(std::string_view name, std::function<void(KeyedArchiver&)> w)
        : name_(name), write_(std::move(w)) {}
    std::string_view className() const override { return name_; }
    void encodeWithCoder(KeyedArchiver& coder) const override { write_(coder); }

   private:
    std::string_view name_;
    std::function<void(KeyedArchiver&)> write_;
  };
  return decodeAs<T>(
      KeyedArchiver::archivedDataWithRootObject(std::make_shared<Partial>(className, write)));
}

// Several objects archived side by side at the top level, as a document
// stores its layers beside the timeline that refers to them, and read back
// with one unarchiver so shared references resolve to the same objects.
struct TopLevelArchive {
  explicit TopLevelArchive(const std::function<void(KeyedArchiver&)>& encode) {
    registerCoreClasses(ClassRegistry::shared());
    MemoryOutputStream out;
    KeyedArchiver archiver(out);
    encode(archiver);
    EXPECT_TRUE(archiver.finish(nullptr));
    data = out.takeBytes();
    in = std::make_unique<MemoryInputStream>(data);
    Error error;
    coder = KeyedUnarchiver::open(*in, &error);
    EXPECT_NE(coder, nullptr) << error.message;
  }
  Bytes data;
  std::unique_ptr<MemoryInputStream> in;
  std::unique_ptr<KeyedUnarchiver> coder;
};

}  // namespace cloudreel::testing
