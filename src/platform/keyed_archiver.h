#pragma once
// Writes a keyed archive: typed values under string keys, objects by class
// name with their own keys, lists and dictionaries of objects, and shared
// references, so an object reached twice is written once and read back as
// one object. The archive is plain CBOR (docs/document-format.md).
//
// The archiver streams: each value goes to the output stream as it is
// encoded, and a byte string goes in one transfer from the caller's memory,
// so archiving a gigabyte of points needs no second gigabyte.

#include <cstdint>
#include <filesystem>
#include <map>
#include <memory>
#include <set>
#include <span>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/byte_stream.h"
#include "platform/error.h"
#include "platform/plane.h"
#include "platform/value.h"

namespace cloudreel {

// Errors of archiving and unarchiving carry this domain and one of these codes.
inline constexpr std::string_view kArchiveErrorDomain = "CloudreelArchive";
enum class ArchiveError {
  NotAnArchive = 1,    // wrong magic or format name
  UnsupportedVersion,  // a container version this build does not read
  Truncated,           // the data ends inside a value
  Malformed,           // not the CBOR this format writes
  WrongType,           // a key read as a kind of value it does not hold
  UnknownClass,        // a class name missing from the registry
  BadReference,        // a shared reference to an object that does not exist
  Cycle,               // an object that contains itself
  TooDeep,             // nesting beyond kMaxArchiveNesting
  ReadFailed,
  WriteFailed,
  ObjectFailed,        // an object refused to encode or decode itself
  NoRootObject,
};

// The deepest nesting of containers (the top level, objects, lists,
// dictionaries) the archiver writes and the unarchiver accepts; it bounds the
// recursion of both.
inline constexpr int kMaxArchiveNesting = 256;

// The text of the archive header and the container version this build writes.
inline constexpr std::string_view kArchiveFormatName = "cloudreel-archive";
inline constexpr std::uint64_t kArchiveVersion = 1;
// The key under which the class name leads every object's map.
inline constexpr std::string_view kArchiveClassKey = "$class";

Error makeArchiveError(ArchiveError code, std::string message);

class KeyedArchiver {
 public:
  // Writes the header; the top level is a keyed container like an object's.
  explicit KeyedArchiver(OutputStream& out);
  KeyedArchiver(const KeyedArchiver&) = delete;
  KeyedArchiver& operator=(const KeyedArchiver&) = delete;

  // Each key is written at most once per container; a second write of a key,
  // or the reserved key "$class", fails the archive.
  void encodeInt32(std::int32_t v, std::string_view key);
  void encodeInt64(std::int64_t v, std::string_view key);
  void encodeFloat(float v, std::string_view key);    // always as a 32-bit float
  void encodeDouble(double v, std::string_view key);  // always as a 64-bit float
  void encodeBool(bool v, std::string_view key);
  void encodeString(std::string_view v, std::string_view key);
  void encodeBytes(std::span<const std::uint8_t> v, std::string_view key);
  // A point of the plane as the text "{x, y}", each coordinate in the
  // shortest decimal form that reads back as the same double.
  void encodePoint(Point2D p, std::string_view key);
  // A null object writes null. An object already written becomes a reference
  // to it; an object that contains itself fails the archive.
  void encodeObject(const ObjectPtr& object, std::string_view key);
  void encodeList(const std::vector<ObjectPtr>& list, std::string_view key);
  template <class T>
  void encodeList(const std::vector<std::shared_ptr<T>>& list, std::string_view key) {
    encodeList(std::vector<ObjectPtr>(list.begin(), list.end()), key);
  }
  void encodeDictionary(const std::map<std::string, ObjectPtr>& dictionary, std::string_view key);
  template <class T>
  void encodeDictionary(const std::map<std::string, std::shared_ptr<T>>& dictionary,
                        std::string_view key) {
    encodeDictionary(std::map<std::string, ObjectPtr>(dictionary.begin(), dictionary.end()), key);
  }

  // An object's encodeWithCoder may refuse to be archived; the first error
  // is kept and everything after it is ignored.
  void failWithError(Error error);
  bool hasFailed() const { return failed_; }
  const Error& error() const { return error_; }

  // Closes the archive. Answers NO, with the reason, if any write failed or
  // the archive was failed; the output is then not a valid archive.
  [[nodiscard]] bool finish(Error* error);

  // The root object under the key "root"; empty when archiving failed (logged).
  static Bytes archivedDataWithRootObject(const ObjectPtr& root);
  // Writes a temporary file beside `path`, syncs it and renames it over
  // `path`, so a failure leaves any previous file untouched.
  [[nodiscard]] static bool archiveRootObjectToFile(const ObjectPtr& root,
                                                    const std::filesystem::path& path,
                                                    Error* error);

 private:
  // The keys written so far into each open container, innermost last.
  struct Container {
    std::string className;  // empty for the top level
    std::set<std::string, std::less<>> keys;
  };

  bool beginValue(std::string_view key);
  void writeRaw(const void* data, std::size_t size);
  void writeText(std::string_view text);
  void writeObjectValue(const ObjectPtr& object);
  std::string containerName() const;

  OutputStream& out_;
  std::vector<Container> containers_;
  // Objects written so far and their share index (the order of their tag 28);
  // kept alive so that an address cannot be reused by another object.
  std::unordered_map<const Object*, std::uint64_t> shareIndex_;
  std::vector<ObjectPtr> written_;
  std::set<const Object*> beingEncoded_;
  int depth_ = 1;  // the top level is the first container
  bool finished_ = false;
  bool failed_ = false;
  Error error_;
};

}  // namespace cloudreel
