#include "platform/keyed_archiver.h"

#include <cbor/encoding.h>
#include <fmt/format.h>

#include "platform/atomic_file.h"
#include "platform/log.h"
#include "platform/object.h"

namespace cloudreel {
namespace {

// Tags of RFC 8949 and the value-sharing registration.
constexpr std::uint64_t kSelfDescribeTag = 55799;
constexpr std::uint64_t kShareableTag = 28;
constexpr std::uint64_t kSharedRefTag = 29;

// The longest head libcbor writes: one initial byte and an 8-byte argument.
constexpr std::size_t kMaxHead = 9;

}  // namespace

Error makeArchiveError(ArchiveError code, std::string message) {
  return Error{std::string(kArchiveErrorDomain), static_cast<int>(code), std::move(message)};
}

KeyedArchiver::KeyedArchiver(OutputStream& out) : out_(out) {
  containers_.push_back(Container{});
  unsigned char head[kMaxHead];
  writeRaw(head, cbor_encode_tag(kSelfDescribeTag, head, sizeof head));
  writeRaw(head, cbor_encode_array_start(3, head, sizeof head));
  writeText(kArchiveFormatName);
  writeRaw(head, cbor_encode_uint(kArchiveVersion, head, sizeof head));
  // The top level, like every object, is written before its key count is known.
  writeRaw(head, cbor_encode_indef_map_start(head, sizeof head));
}

void KeyedArchiver::failWithError(Error error) {
  if (!failed_) {
    failed_ = true;
    error_ = std::move(error);
  }
}

void KeyedArchiver::writeRaw(const void* data, std::size_t size) {
  if (failed_) {
    return;
  }
  if (!out_.write(data, size)) {
    failWithError(makeArchiveError(ArchiveError::WriteFailed, "writing the archive failed"));
  }
}

void KeyedArchiver::writeText(std::string_view text) {
  unsigned char head[kMaxHead];
  writeRaw(head, cbor_encode_string_start(text.size(), head, sizeof head));
  writeRaw(text.data(), text.size());
}

std::string KeyedArchiver::containerName() const {
  const std::string& name = containers_.back().className;
  return name.empty() ? std::string("the top level") : "a " + name;
}

bool KeyedArchiver::beginValue(std::string_view key) {
  if (failed_ || finished_) {
    return false;
  }
  Container& container = containers_.back();
  if (key == kArchiveClassKey) {
    failWithError(makeArchiveError(ArchiveError::ObjectFailed,
                                   "the key \"$class\" is reserved, written in " + containerName()));
    return false;
  }
  // A streamed map cannot take back a value, and CBOR readers may keep either
  // of two equal keys, so a repeated key is refused rather than written.
  if (!container.keys.emplace(key).second) {
    failWithError(makeArchiveError(ArchiveError::ObjectFailed, "the key \"" + std::string(key) +
                                                                   "\" is written twice in " +
                                                                   containerName()));
    return false;
  }
  writeText(key);
  return true;
}

void KeyedArchiver::encodeInt64(std::int64_t v, std::string_view key) {
  if (!beginValue(key)) {
    return;
  }
  unsigned char head[kMaxHead];
  std::size_t n = v >= 0 ? cbor_encode_uint(static_cast<std::uint64_t>(v), head, sizeof head)
                         : cbor_encode_negint(static_cast<std::uint64_t>(-(v + 1)), head,
                                              sizeof head);
  writeRaw(head, n);
}

void KeyedArchiver::encodeInt32(std::int32_t v, std::string_view key) { encodeInt64(v, key); }

void KeyedArchiver::encodeFloat(float v, std::string_view key) {
  if (!beginValue(key)) {
    return;
  }
  unsigned char head[kMaxHead];
  writeRaw(head, cbor_encode_single(v, head, sizeof head));
}

void KeyedArchiver::encodeDouble(double v, std::string_view key) {
  if (!beginValue(key)) {
    return;
  }
  unsigned char head[kMaxHead];
  writeRaw(head, cbor_encode_double(v, head, sizeof head));
}

void KeyedArchiver::encodeBool(bool v, std::string_view key) {
  if (!beginValue(key)) {
    return;
  }
  unsigned char head[kMaxHead];
  writeRaw(head, cbor_encode_bool(v, head, sizeof head));
}

void KeyedArchiver::encodeString(std::string_view v, std::string_view key) {
  if (beginValue(key)) {
    writeText(v);
  }
}

void KeyedArchiver::encodeBytes(std::span<const std::uint8_t> v, std::string_view key) {
  if (!beginValue(key)) {
    return;
  }
  unsigned char head[kMaxHead];
  writeRaw(head, cbor_encode_bytestring_start(v.size(), head, sizeof head));
  // One transfer from the caller's memory; a file stream passes it straight on.
  writeRaw(v.data(), v.size());
}

void KeyedArchiver::encodePoint(Point2D p, std::string_view key) {
  // fmt's plain "{}" is the shortest round-trip form: 0.1 stays "0.1".
  encodeString(fmt::format("{{{}, {}}}", p.x, p.y), key);
}

void KeyedArchiver::writeObjectValue(const ObjectPtr& object) {
  unsigned char head[kMaxHead];
  if (!object) {
    writeRaw(head, cbor_encode_null(head, sizeof head));
    return;
  }
  const Object* identity = object.get();
  if (auto found = shareIndex_.find(identity); found != shareIndex_.end()) {
    if (beingEncoded_.count(identity) != 0) {
      failWithError(makeArchiveError(
          ArchiveError::Cycle, "a " + std::string(object->className()) + " contains itself"));
      return;
    }
    writeRaw(head, cbor_encode_tag(kSharedRefTag, head, sizeof head));
    writeRaw(head, cbor_encode_uint(found->second, head, sizeof head));
    return;
  }
  if (depth_ >= kMaxArchiveNesting) {
    failWithError(makeArchiveError(ArchiveError::TooDeep, "objects are nested more than " +
                                                              std::to_string(kMaxArchiveNesting) +
                                                              " deep"));
    return;
  }
  // Every object is shareable; its index is its place among the tag 28
  // values in the order they begin, which is also the order a reader meets them.
  shareIndex_.emplace(identity, written_.size());
  written_.push_back(object);
  std::string className(object->className());
  writeRaw(head, cbor_encode_tag(kShareableTag, head, sizeof head));
  writeRaw(head, cbor_encode_indef_map_start(head, sizeof head));
  writeText(kArchiveClassKey);
  writeText(className);

  containers_.push_back(Container{std::move(className), {}});
  beingEncoded_.insert(identity);
  ++depth_;
  object->encodeWithCoder(*this);
  --depth_;
  beingEncoded_.erase(identity);
  containers_.pop_back();
  writeRaw(head, cbor_encode_break(head, sizeof head));
}

void KeyedArchiver::encodeObject(const ObjectPtr& object, std::string_view key) {
  if (beginValue(key)) {
    writeObjectValue(object);
  }
}

void KeyedArchiver::encodeList(const std::vector<ObjectPtr>& list, std::string_view key) {
  if (!beginValue(key)) {
    return;
  }
  if (depth_ >= kMaxArchiveNesting) {
    failWithError(makeArchiveError(ArchiveError::TooDeep, "a list is nested too deep"));
    return;
  }
  unsigned char head[kMaxHead];
  writeRaw(head, cbor_encode_array_start(list.size(), head, sizeof head));
  ++depth_;
  for (const ObjectPtr& element : list) {
    writeObjectValue(element);
  }
  --depth_;
}

void KeyedArchiver::encodeDictionary(const std::map<std::string, ObjectPtr>& dictionary,
                                     std::string_view key) {
  if (!beginValue(key)) {
    return;
  }
  if (depth_ >= kMaxArchiveNesting) {
    failWithError(makeArchiveError(ArchiveError::TooDeep, "a dictionary is nested too deep"));
    return;
  }
  unsigned char head[kMaxHead];
  writeRaw(head, cbor_encode_map_start(dictionary.size(), head, sizeof head));
  ++depth_;
  for (const auto& [name, element] : dictionary) {
    writeText(name);
    writeObjectValue(element);
  }
  --depth_;
}

bool KeyedArchiver::finish(Error* error) {
  if (!finished_ && !failed_) {
    if (containers_.size() != 1) {
      failWithError(makeArchiveError(ArchiveError::ObjectFailed,
                                     "the archive was finished from inside an object"));
    } else {
      unsigned char head[kMaxHead];
      writeRaw(head, cbor_encode_break(head, sizeof head));
    }
  }
  finished_ = true;
  if (failed_) {
    if (error != nullptr) {
      *error = error_;
    }
    return false;
  }
  return true;
}

Bytes KeyedArchiver::archivedDataWithRootObject(const ObjectPtr& root) {
  MemoryOutputStream out;
  KeyedArchiver archiver(out);
  archiver.encodeObject(root, "root");
  Error error;
  if (!archiver.finish(&error)) {
    logWarningf("archiving failed: %s", error.message);
    return {};
  }
  return out.takeBytes();
}

bool KeyedArchiver::archiveRootObjectToFile(const ObjectPtr& root,
                                            const std::filesystem::path& path, Error* error) {
  AtomicFileReplacement replacement(path);
  Error reason;
  auto stream = FileOutputStream::create(replacement.temporaryPath(), &reason);
  if (stream) {
    KeyedArchiver archiver(*stream);
    archiver.encodeObject(root, "root");
    if (!archiver.finish(&reason)) {
      // The archive's own reason, unless it was the stream that failed.
      if (!stream->error().message.empty()) {
        reason = stream->error();
      }
    } else if (stream->sync() && stream->close()) {
      return replacement.commit(error);
    } else {
      reason = stream->error();
    }
  }
  // The replacement removes the temporary file; the old file is untouched.
  setError(error, reason.domain, reason.code, "cannot save " + path.string() + ": " + reason.message);
  return false;
}

}  // namespace cloudreel
