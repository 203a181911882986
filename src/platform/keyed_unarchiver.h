#pragma once
// Reads a keyed archive written by KeyedArchiver. Opening parses the whole
// structure and checks it, so a truncated or hostile archive fails before any
// object is made; byte strings are not loaded then, only located, and are read
// when asked for, straight into the caller's storage if it wishes.
//
// While an object's initWithCoder runs, the decode calls read that object's
// keys. Reading a key as a kind of value it does not hold (a string as an int,
// a list as an object) fails the whole decode: from then on every decode
// answers a zero value and the top-level call answers null with the error.
// Missing keys, and keys holding null, read as 0, NO, 0.0, an empty string,
// empty bytes or null without failing.
//
// Numbers convert between kinds: integers, floats and booleans may be read
// as one another. A float read as an integer truncates toward zero; an
// integer out of the range asked for, or a float that is not a number or out
// of range, fails the decode rather than wrapping. A float32 value read as a
// double is the exact widening (0.1f reads as 0.10000000149011612).

#include <cstdint>
#include <filesystem>
#include <map>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "platform/byte_stream.h"
#include "platform/class_registry.h"
#include "platform/error.h"
#include "platform/keyed_archiver.h"
#include "platform/object.h"
#include "platform/plane.h"
#include "platform/value.h"

namespace cloudreel {

// What a key holds. GCC's -Wshadow takes the scoped enumerator Bytes for a
// shadow of the Bytes type, though it can only be named as
// ArchiveValueType::Bytes.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wshadow"
enum class ArchiveValueType { Null, Integer, Float, Bool, String, Bytes, Object, List, Dictionary };
#pragma GCC diagnostic pop

class KeyedUnarchiver {
 public:
  // Parses and checks the whole structure; null with the error for anything
  // that is not a valid archive. The stream must outlive the unarchiver.
  static std::unique_ptr<KeyedUnarchiver> open(
      InputStream& in, Error* error, const ClassRegistry& registry = ClassRegistry::shared());
  // The object under the key "root".
  static ObjectPtr unarchiveObjectWithData(
      std::span<const std::uint8_t> data, Error* error,
      const ClassRegistry& registry = ClassRegistry::shared());
  static ObjectPtr unarchiveObjectWithFile(
      const std::filesystem::path& path, Error* error,
      const ClassRegistry& registry = ClassRegistry::shared());

  ~KeyedUnarchiver();
  KeyedUnarchiver(const KeyedUnarchiver&) = delete;
  KeyedUnarchiver& operator=(const KeyedUnarchiver&) = delete;

  // --- the keys of the container being read (the top level, or the object
  // whose initWithCoder is running)
  bool containsValueForKey(std::string_view key) const;
  std::vector<std::string> allKeys() const;  // sorted
  // Null for a missing key as well as for a null value.
  ArchiveValueType typeOfValueForKey(std::string_view key) const;

  std::int32_t decodeInt32ForKey(std::string_view key);
  std::int64_t decodeInt64ForKey(std::string_view key);
  float decodeFloatForKey(std::string_view key);  // a float64 narrows to the nearest float
  double decodeDoubleForKey(std::string_view key);
  bool decodeBoolForKey(std::string_view key);  // a number reads as YES when non-zero
  std::string decodeStringForKey(std::string_view key);
  // A point written by encodePoint; missing or null reads as (0, 0). Any
  // other value, or a string not of the form "{x, y}", fails the decode.
  Point2D decodePointForKey(std::string_view key);
  Bytes decodeBytesForKey(std::string_view key);
  // The length of a byte string, or nothing when the key holds none; lets a
  // big owner allocate its storage and read straight into it.
  std::optional<std::size_t> bytesLengthForKey(std::string_view key) const;
  // Reads a byte string whose length equals destination.size(); a missing
  // key answers NO, a wrong kind or a length that differs fails the decode.
  bool decodeBytesForKeyInto(std::string_view key, std::span<std::uint8_t> destination);
  // The same for the first destination.size() bytes of a byte string at
  // least that long.
  bool decodeLeadingBytesForKeyInto(std::string_view key, std::span<std::uint8_t> destination);

  ObjectPtr decodeObjectForKey(std::string_view key);
  // An object of another class fails the decode.
  template <class T>
  std::shared_ptr<T> decodeObjectOfClassForKey(std::string_view key) {
    return castOrFail<T>(decodeObjectForKey(key), key);
  }
  // Nothing when the key is missing or null; null elements stay null.
  std::optional<std::vector<ObjectPtr>> decodeListForKey(std::string_view key);
  template <class T>
  std::optional<std::vector<std::shared_ptr<T>>> decodeListOfClassForKey(std::string_view key) {
    auto list = decodeListForKey(key);
    if (!list) {
      return std::nullopt;
    }
    std::vector<std::shared_ptr<T>> cast;
    for (const ObjectPtr& element : *list) {
      cast.push_back(castOrFail<T>(element, key));
    }
    return hasFailed() ? std::nullopt : std::optional(std::move(cast));
  }
  std::optional<std::map<std::string, ObjectPtr>> decodeDictionaryForKey(std::string_view key);
  template <class T>
  std::optional<std::map<std::string, std::shared_ptr<T>>> decodeDictionaryOfClassForKey(
      std::string_view key) {
    auto dictionary = decodeDictionaryForKey(key);
    if (!dictionary) {
      return std::nullopt;
    }
    std::map<std::string, std::shared_ptr<T>> cast;
    for (const auto& [name, element] : *dictionary) {
      cast.emplace(name, castOrFail<T>(element, key));
    }
    return hasFailed() ? std::nullopt : std::optional(std::move(cast));
  }

  // An object's initWithCoder may fail the whole decode; the first error is kept.
  void failWithError(Error error);
  bool hasFailed() const { return failed_; }
  const Error& error() const { return error_; }

 private:
  struct Node;
  struct Container;
  struct ObjectRecord;
  class Parser;

  KeyedUnarchiver(InputStream& in, const ClassRegistry& registry);

  const Node* find(std::string_view key) const;
  ObjectPtr objectAt(std::size_t index);
  ObjectPtr objectOrNull(const std::optional<std::size_t>& reference);
  bool readBytes(const Node& node, std::uint8_t* destination);
  bool decodeBytesInto(std::string_view key, std::span<std::uint8_t> destination,
                       bool leadingOnly);
  void failWrongType(std::string_view key, const char* asked);
  // An integer of type I under the key; a value outside I's range fails.
  template <typename I>
  I decodeIntegerForKey(std::string_view key, const char* asked);
  std::string where() const;

  template <class T>
  std::shared_ptr<T> castOrFail(const ObjectPtr& object, std::string_view key) {
    if (!object) {
      return nullptr;
    }
    auto cast = std::dynamic_pointer_cast<T>(object);
    if (!cast) {
      failWrongClass(key, object->className());
    }
    return cast;
  }
  void failWrongClass(std::string_view key, std::string_view className);

  InputStream& in_;
  const ClassRegistry& registry_;
  std::unique_ptr<Container> top_;
  std::vector<ObjectRecord> objects_;  // in the order of their tag 28
  std::vector<std::vector<std::optional<std::size_t>>> lists_;
  std::vector<std::map<std::string, std::optional<std::size_t>>> dictionaries_;
  // The containers whose keys are being read, innermost last; the first is
  // the top level. An object's entry is its index in objects_.
  std::vector<const Container*> reading_;
  std::vector<std::size_t> decodingObjects_;
  bool failed_ = false;
  Error error_;
};

}  // namespace cloudreel
