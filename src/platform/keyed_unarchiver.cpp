#include "platform/keyed_unarchiver.h"

#include <bit>
#include <cfloat>
#include <charconv>
#include <cmath>
#include <cstring>
#include <limits>

namespace cloudreel {

// One value of a keyed container, as parsed. Byte strings are located, not
// loaded; objects, lists and dictionaries are indexes into the unarchiver's
// tables.
struct KeyedUnarchiver::Node {
  ArchiveValueType type = ArchiveValueType::Null;
  bool single = false;  // a Float written as float32
  bool boolean = false;
  std::int64_t integer = 0;
  double real = 0.0;
  std::string text;
  std::uint64_t offset = 0;  // Bytes: where the bytes begin in the stream
  std::uint64_t length = 0;
  std::size_t index = 0;  // Object, List, Dictionary
};

struct KeyedUnarchiver::Container {
  std::map<std::string, Node, std::less<>> values;
};

struct KeyedUnarchiver::ObjectRecord {
  enum class State { Parsing, Parsed, Decoding, Decoded };
  std::string className;
  Container container;
  ObjectPtr object;
  State state = State::Parsing;
};

namespace {

constexpr std::uint64_t kSelfDescribeTag = 55799;
constexpr std::uint64_t kShareableTag = 28;
constexpr std::uint64_t kSharedRefTag = 29;

// The format name is short; a longer text there is not ours and is not read.
constexpr std::uint64_t kMaxFormatNameLength = 64;

enum Major : std::uint8_t {
  kUnsigned = 0,
  kNegative = 1,
  kByteString = 2,
  kTextString = 3,
  kArray = 4,
  kMap = 5,
  kTag = 6,
  kSimple = 7,
};

double halfToDouble(std::uint16_t half) {
  int exponent = (half >> 10) & 0x1f;
  int mantissa = half & 0x3ff;
  double value;
  if (exponent == 0) {
    value = std::ldexp(mantissa, -24);
  } else if (exponent != 31) {
    value = std::ldexp(mantissa + 1024, exponent - 25);
  } else {
    value = mantissa == 0 ? std::numeric_limits<double>::infinity()
                          : std::numeric_limits<double>::quiet_NaN();
  }
  return (half & 0x8000) != 0 ? -value : value;
}

const char* typeName(ArchiveValueType type) {
  switch (type) {
    case ArchiveValueType::Null: return "null";
    case ArchiveValueType::Integer: return "an integer";
    case ArchiveValueType::Float: return "a float";
    case ArchiveValueType::Bool: return "a boolean";
    case ArchiveValueType::String: return "a string";
    case ArchiveValueType::Bytes: return "bytes";
    case ArchiveValueType::Object: return "an object";
    case ArchiveValueType::List: return "a list";
    case ArchiveValueType::Dictionary: return "a dictionary";
  }
  return "an unknown value";
}

}  // namespace

// ---------------------------------------------------------------------------
// Parsing
//
// A recursive descent over the CBOR items this format writes. Every length
// and count from the stream is checked against the bytes that remain before
// it is used, nothing is reserved by a count, and the recursion stops at
// kMaxArchiveNesting.

class KeyedUnarchiver::Parser {
 public:
  explicit Parser(KeyedUnarchiver& owner) : u_(owner), in_(owner.in_) {}

  bool parseArchive() {
    Head head;
    if (!readHead(head) || head.major != kTag || head.value != kSelfDescribeTag) {
      return notAnArchive("it does not begin with the CBOR self-describe tag");
    }
    if (!readHead(head) || head.major != kArray || head.indefinite || head.value != 3) {
      return notAnArchive("it has no archive header");
    }
    if (!readHead(head) || head.major != kTextString || head.indefinite ||
        head.value > kMaxFormatNameLength) {
      return notAnArchive("it has no format name");
    }
    std::string name;
    if (!readText(head.value, name) || name != kArchiveFormatName) {
      return notAnArchive("its format is not " + std::string(kArchiveFormatName));
    }
    if (!readHead(head) || head.major != kUnsigned) {
      return notAnArchive("it has no container version");
    }
    if (head.value != kArchiveVersion) {
      return fail(ArchiveError::UnsupportedVersion,
                  "the archive has container version " + std::to_string(head.value) +
                      "; this build reads version " + std::to_string(kArchiveVersion));
    }
    u_.top_ = std::make_unique<Container>();
    if (!readHead(head) || head.major != kMap) {
      return fail(ArchiveError::Malformed, "the archive's top level is not a map");
    }
    if (!parseEntries(*u_.top_, head, 1, nullptr)) {
      return false;
    }
    if (in_.remaining() != 0) {
      return fail(ArchiveError::Malformed, "unexpected data after the end of the archive");
    }
    return true;
  }

  const Error& error() const { return error_; }

 private:
  struct Head {
    std::uint8_t major = 0;
    std::uint8_t info = 0;
    std::uint64_t value = 0;  // the argument; the raw bits of a float
    bool indefinite = false;
  };

  bool fail(ArchiveError code, std::string message) {
    error_ = makeArchiveError(code, std::move(message));
    return false;
  }
  bool notAnArchive(const std::string& why) {
    return fail(ArchiveError::NotAnArchive, "not a Cloudreel archive: " + why);
  }
  bool truncated() { return fail(ArchiveError::Truncated, "the archive is truncated"); }
  bool malformed(const std::string& what) {
    return fail(ArchiveError::Malformed,
                what + " at byte " + std::to_string(headStart_) + " of the archive");
  }

  bool readHead(Head& head) {
    headStart_ = in_.position();
    std::uint8_t initial = 0;
    if (!in_.read(&initial, 1)) {
      return truncated();
    }
    head = Head{};
    head.major = static_cast<std::uint8_t>(initial >> 5);
    head.info = initial & 0x1f;
    if (head.info < 24) {
      head.value = head.info;
    } else if (head.info <= 27) {
      std::size_t size = std::size_t{1} << (head.info - 24);
      std::uint8_t bytes[8];
      if (!in_.read(bytes, size)) {
        return truncated();
      }
      for (std::size_t i = 0; i < size; ++i) {
        head.value = (head.value << 8) | bytes[i];
      }
    } else if (head.info == 31 && head.major >= kByteString && head.major != kTag) {
      head.indefinite = true;
    } else {
      return malformed("an invalid CBOR head");
    }
    return true;
  }

  bool readText(std::uint64_t length, std::string& text) {
    if (length > in_.remaining()) {
      return truncated();
    }
    text.resize(static_cast<std::size_t>(length));
    return in_.read(text.data(), text.size()) || truncated();
  }

  bool checkDepth(int depth) {
    if (depth > kMaxArchiveNesting) {
      return fail(ArchiveError::TooDeep, "the archive nests containers more than " +
                                             std::to_string(kMaxArchiveNesting) + " deep");
    }
    return true;
  }

  // A count of items, each at least `itemSize` bytes, that the stream can hold.
  bool checkCount(const Head& head, std::uint64_t itemSize, const char* what) {
    if (head.indefinite) {
      return malformed(std::string("an indefinite-length ") + what);
    }
    if (head.value > in_.remaining() / itemSize) {
      return fail(ArchiveError::Truncated, std::string("a ") + what + " claims " +
                                               std::to_string(head.value) +
                                               " entries, more than the archive holds");
    }
    return true;
  }

  bool readKey(std::string& key) {
    Head head;
    if (!readHead(head)) {
      return false;
    }
    if (head.major != kTextString || head.indefinite) {
      return malformed("a key that is not a text string");
    }
    return readText(head.value, key);
  }

  // The entries of the top level or of an object (after its class name), up
  // to the count or the break.
  bool parseEntries(Container& container, const Head& mapHead, int depth,
                    std::string* className) {
    if (!checkDepth(depth)) {
      return false;
    }
    std::uint64_t count = 0;
    if (!mapHead.indefinite) {
      if (!checkCount(mapHead, 2, "map")) {
        return false;
      }
      count = mapHead.value;
    }
    if (className != nullptr) {
      std::string key;
      Head head;
      if ((!mapHead.indefinite && count == 0) || !readKey(key) || key != kArchiveClassKey ||
          !readHead(head) || head.major != kTextString || head.indefinite ||
          !readText(head.value, *className)) {
        return error_.message.empty() ? malformed("an object without a class name") : false;
      }
      --count;
    }
    for (std::uint64_t i = 0; mapHead.indefinite || i < count; ++i) {
      std::string key;
      if (mapHead.indefinite) {
        Head head;
        if (!readHead(head)) {
          return false;
        }
        if (head.major == kSimple && head.indefinite) {
          break;
        }
        if (head.major != kTextString || head.indefinite) {
          return malformed("a key that is not a text string");
        }
        if (!readText(head.value, key)) {
          return false;
        }
      } else if (!readKey(key)) {
        return false;
      }
      if (key == kArchiveClassKey || container.values.count(key) != 0) {
        return malformed("the key \"" + key + "\" appears twice");
      }
      Node node;
      if (!parseValue(node, depth)) {
        return false;
      }
      container.values.emplace(std::move(key), std::move(node));
    }
    return true;
  }

  // An object after its tag 28; `depth` is the object's own nesting.
  bool parseObject(std::size_t& index, int depth) {
    if (!checkDepth(depth)) {
      return false;
    }
    index = u_.objects_.size();
    u_.objects_.emplace_back();
    Head head;
    if (!readHead(head)) {
      return false;
    }
    if (head.major != kMap) {
      return malformed("a shareable value that is not an object's map");
    }
    Container container;
    std::string className;
    if (!parseEntries(container, head, depth, &className)) {
      return false;
    }
    ObjectRecord& record = u_.objects_[index];
    record.className = std::move(className);
    record.container = std::move(container);
    record.state = ObjectRecord::State::Parsed;
    return true;
  }

  bool parseReference(std::size_t& index) {
    Head head;
    if (!readHead(head)) {
      return false;
    }
    if (head.major != kUnsigned) {
      return malformed("a shared reference that is not an index");
    }
    if (head.value >= u_.objects_.size()) {
      return fail(ArchiveError::BadReference, "a shared reference to object " +
                                                  std::to_string(head.value) +
                                                  ", which does not exist");
    }
    index = static_cast<std::size_t>(head.value);
    // References reach only objects already complete, so the graph has no
    // cycles; an object still open here would contain itself.
    if (u_.objects_[index].state == ObjectRecord::State::Parsing) {
      return fail(ArchiveError::Cycle, "a " + u_.objects_[index].className +
                                           " object contains itself");
    }
    return true;
  }

  // An element of a list or dictionary: an object, a reference or null.
  bool parseElement(std::optional<std::size_t>& element, int depth) {
    Head head;
    if (!readHead(head)) {
      return false;
    }
    std::size_t index = 0;
    if (head.major == kSimple && head.info == 22) {
      element.reset();
      return true;
    }
    if (head.major == kTag && head.value == kShareableTag) {
      if (!parseObject(index, depth)) {
        return false;
      }
    } else if (head.major == kTag && head.value == kSharedRefTag) {
      if (!parseReference(index)) {
        return false;
      }
    } else {
      return malformed("a list or dictionary element that is not an object");
    }
    element = index;
    return true;
  }

  // A value inside a container at nesting `depth`.
  bool parseValue(Node& node, int depth) {
    Head head;
    if (!readHead(head)) {
      return false;
    }
    switch (head.major) {
      case kUnsigned:
      case kNegative:
        if (head.value > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max())) {
          return malformed("an integer beyond the 64-bit range");
        }
        node.type = ArchiveValueType::Integer;
        node.integer = head.major == kUnsigned ? static_cast<std::int64_t>(head.value)
                                               : -static_cast<std::int64_t>(head.value) - 1;
        return true;
      case kByteString:
        if (head.indefinite) {
          return malformed("an indefinite-length byte string");
        }
        if (head.value > in_.remaining()) {
          return fail(ArchiveError::Truncated,
                      "a byte string claims " + std::to_string(head.value) +
                          " bytes, more than the archive holds");
        }
        node.type = ArchiveValueType::Bytes;
        node.offset = in_.position();
        node.length = head.value;
        return in_.seek(node.offset + node.length) || truncated();
      case kTextString:
        if (head.indefinite) {
          return malformed("an indefinite-length text string");
        }
        node.type = ArchiveValueType::String;
        return readText(head.value, node.text);
      case kArray: {
        if (!checkDepth(depth + 1) || !checkCount(head, 1, "list")) {
          return false;
        }
        std::vector<std::optional<std::size_t>> list;
        for (std::uint64_t i = 0; i < head.value; ++i) {
          std::optional<std::size_t> element;
          if (!parseElement(element, depth + 2)) {
            return false;
          }
          list.push_back(element);
        }
        node.type = ArchiveValueType::List;
        node.index = u_.lists_.size();
        u_.lists_.push_back(std::move(list));
        return true;
      }
      case kMap: {
        if (!checkDepth(depth + 1) || !checkCount(head, 2, "dictionary")) {
          return false;
        }
        std::map<std::string, std::optional<std::size_t>> dictionary;
        for (std::uint64_t i = 0; i < head.value; ++i) {
          std::string key;
          std::optional<std::size_t> element;
          if (!readKey(key) || !parseElement(element, depth + 2)) {
            return false;
          }
          if (!dictionary.emplace(std::move(key), element).second) {
            return malformed("a dictionary key that appears twice");
          }
        }
        node.type = ArchiveValueType::Dictionary;
        node.index = u_.dictionaries_.size();
        u_.dictionaries_.push_back(std::move(dictionary));
        return true;
      }
      case kTag:
        node.type = ArchiveValueType::Object;
        if (head.value == kShareableTag) {
          return parseObject(node.index, depth + 1);
        }
        if (head.value == kSharedRefTag) {
          return parseReference(node.index);
        }
        return malformed("an unexpected CBOR tag " + std::to_string(head.value));
      default:  // kSimple
        switch (head.info) {
          case 20:
          case 21:
            node.type = ArchiveValueType::Bool;
            node.boolean = head.info == 21;
            return true;
          case 22:
            node.type = ArchiveValueType::Null;
            return true;
          case 25:
            node.type = ArchiveValueType::Float;
            node.single = true;  // a half widens exactly to float32
            node.real = halfToDouble(static_cast<std::uint16_t>(head.value));
            return true;
          case 26:
            node.type = ArchiveValueType::Float;
            node.single = true;
            node.real = std::bit_cast<float>(static_cast<std::uint32_t>(head.value));
            return true;
          case 27:
            node.type = ArchiveValueType::Float;
            node.real = std::bit_cast<double>(head.value);
            return true;
          default:
            return malformed(head.indefinite ? "an unexpected break" : "an unexpected simple value");
        }
    }
  }

  KeyedUnarchiver& u_;
  InputStream& in_;
  std::uint64_t headStart_ = 0;
  Error error_;
};

// ---------------------------------------------------------------------------
// Opening

KeyedUnarchiver::KeyedUnarchiver(InputStream& in, const ClassRegistry& registry)
    : in_(in), registry_(registry) {}

KeyedUnarchiver::~KeyedUnarchiver() = default;

std::unique_ptr<KeyedUnarchiver> KeyedUnarchiver::open(InputStream& in, Error* error,
                                                       const ClassRegistry& registry) {
  std::unique_ptr<KeyedUnarchiver> unarchiver(new KeyedUnarchiver(in, registry));
  if (!in.seek(0)) {
    setError(error, std::string(kArchiveErrorDomain), static_cast<int>(ArchiveError::ReadFailed),
             "cannot read the archive");
    return nullptr;
  }
  Parser parser(*unarchiver);
  if (!parser.parseArchive()) {
    if (error != nullptr) {
      *error = parser.error();
    }
    return nullptr;
  }
  unarchiver->reading_.push_back(unarchiver->top_.get());
  return unarchiver;
}

namespace {

ObjectPtr rootObject(KeyedUnarchiver* unarchiver, Error* error) {
  if (unarchiver == nullptr) {
    return nullptr;
  }
  ObjectPtr root = unarchiver->decodeObjectForKey("root");
  if (unarchiver->hasFailed()) {
    if (error != nullptr) {
      *error = unarchiver->error();
    }
    return nullptr;
  }
  if (!root) {
    setError(error, std::string(kArchiveErrorDomain), static_cast<int>(ArchiveError::NoRootObject),
             "the archive has no root object");
  }
  return root;
}

}  // namespace

ObjectPtr KeyedUnarchiver::unarchiveObjectWithData(std::span<const std::uint8_t> data,
                                                   Error* error, const ClassRegistry& registry) {
  MemoryInputStream in(data);
  return rootObject(open(in, error, registry).get(), error);
}

ObjectPtr KeyedUnarchiver::unarchiveObjectWithFile(const std::filesystem::path& path,
                                                   Error* error, const ClassRegistry& registry) {
  auto in = FileInputStream::open(path, error);
  if (!in) {
    return nullptr;
  }
  Error reason;
  ObjectPtr root = rootObject(open(*in, &reason, registry).get(), &reason);
  if (!root) {
    setError(error, reason.domain, reason.code,
             "cannot read " + path.string() + ": " + reason.message);
  }
  return root;
}

// ---------------------------------------------------------------------------
// Decoding

void KeyedUnarchiver::failWithError(Error error) {
  if (!failed_) {
    failed_ = true;
    error_ = std::move(error);
  }
}

std::string KeyedUnarchiver::where() const {
  if (decodingObjects_.empty()) {
    return "the top level";
  }
  return "a " + objects_[decodingObjects_.back()].className;
}

void KeyedUnarchiver::failWrongType(std::string_view key, const char* asked) {
  const Node* node = find(key);
  failWithError(makeArchiveError(
      ArchiveError::WrongType, "the key \"" + std::string(key) + "\" of " + where() + " holds " +
                                   typeName(node ? node->type : ArchiveValueType::Null) +
                                   ", not " + asked));
}

void KeyedUnarchiver::failWrongClass(std::string_view key, std::string_view className) {
  failWithError(makeArchiveError(ArchiveError::WrongType,
                                 "the key \"" + std::string(key) + "\" of " + where() +
                                     " holds a " + std::string(className) +
                                     ", not an object of the class asked for"));
}

const KeyedUnarchiver::Node* KeyedUnarchiver::find(std::string_view key) const {
  const auto& values = reading_.back()->values;
  auto found = values.find(key);
  return found == values.end() ? nullptr : &found->second;
}

bool KeyedUnarchiver::containsValueForKey(std::string_view key) const {
  return find(key) != nullptr;
}

std::vector<std::string> KeyedUnarchiver::allKeys() const {
  std::vector<std::string> keys;
  for (const auto& entry : reading_.back()->values) {
    keys.push_back(entry.first);
  }
  return keys;
}

ArchiveValueType KeyedUnarchiver::typeOfValueForKey(std::string_view key) const {
  const Node* node = find(key);
  return node ? node->type : ArchiveValueType::Null;
}

namespace {

// An integer of the given range from a node holding a number; nothing when
// it is out of range or not a number.
std::optional<std::int64_t> integerIn(std::int64_t min, std::int64_t max, ArchiveValueType type,
                                      std::int64_t integer, double real, bool boolean) {
  switch (type) {
    case ArchiveValueType::Integer:
      if (integer < min || integer > max) {
        return std::nullopt;
      }
      return integer;
    case ArchiveValueType::Bool:
      return boolean ? 1 : 0;
    case ArchiveValueType::Float: {
      double truncated = std::trunc(real);
      // static_cast<double>(max) + 1 is exactly 2^31 or 2^63, the first value out of range.
      if (std::isnan(truncated) || truncated < static_cast<double>(min) ||
          truncated >= static_cast<double>(max) + 1.0) {
        return std::nullopt;
      }
      return static_cast<std::int64_t>(truncated);
    }
    default:
      return std::nullopt;
  }
}

}  // namespace

template <typename I>
I KeyedUnarchiver::decodeIntegerForKey(std::string_view key, const char* asked) {
  const Node* node = failed_ ? nullptr : find(key);
  if (node == nullptr || node->type == ArchiveValueType::Null) {
    return 0;
  }
  auto value = integerIn(std::numeric_limits<I>::min(), std::numeric_limits<I>::max(),
                         node->type, node->integer, node->real, node->boolean);
  if (!value) {
    failWrongType(key, asked);
    return 0;
  }
  return static_cast<I>(*value);
}

std::int64_t KeyedUnarchiver::decodeInt64ForKey(std::string_view key) {
  return decodeIntegerForKey<std::int64_t>(key, "a 64-bit integer");
}

std::int32_t KeyedUnarchiver::decodeInt32ForKey(std::string_view key) {
  return decodeIntegerForKey<std::int32_t>(key, "a 32-bit integer");
}

double KeyedUnarchiver::decodeDoubleForKey(std::string_view key) {
  const Node* node = failed_ ? nullptr : find(key);
  if (node == nullptr) {
    return 0.0;
  }
  switch (node->type) {
    case ArchiveValueType::Null: return 0.0;
    case ArchiveValueType::Float: return node->real;
    case ArchiveValueType::Integer: return static_cast<double>(node->integer);
    case ArchiveValueType::Bool: return node->boolean ? 1.0 : 0.0;
    default: failWrongType(key, "a float"); return 0.0;
  }
}

float KeyedUnarchiver::decodeFloatForKey(std::string_view key) {
  const Node* node = failed_ ? nullptr : find(key);
  if (node != nullptr && node->type == ArchiveValueType::Integer) {
    return static_cast<float>(node->integer);  // every int64 is within the float range
  }
  return narrowToFloat(decodeDoubleForKey(key));  // value.h: no UB beyond the float range
}

bool KeyedUnarchiver::decodeBoolForKey(std::string_view key) {
  const Node* node = failed_ ? nullptr : find(key);
  if (node == nullptr) {
    return false;
  }
  switch (node->type) {
    case ArchiveValueType::Null: return false;
    case ArchiveValueType::Bool: return node->boolean;
    case ArchiveValueType::Integer: return node->integer != 0;
    case ArchiveValueType::Float: return node->real != 0.0;
    default: failWrongType(key, "a boolean"); return false;
  }
}

std::string KeyedUnarchiver::decodeStringForKey(std::string_view key) {
  const Node* node = failed_ ? nullptr : find(key);
  if (node == nullptr || node->type == ArchiveValueType::Null) {
    return {};
  }
  if (node->type != ArchiveValueType::String) {
    failWrongType(key, "a string");
    return {};
  }
  return node->text;
}

namespace {

// The text "{x, y}" that encodePoint writes; spaces around the numbers are
// allowed, anything else is not. Nothing when the text is not of that form or
// a number lies beyond the double range.
std::optional<Point2D> parsePoint(std::string_view text) {
  const char* p = text.data();
  const char* const end = p + text.size();
  auto skipSpaces = [&] {
    while (p != end && *p == ' ') ++p;
  };
  auto expect = [&](char c) {
    skipSpaces();
    if (p == end || *p != c) {
      return false;
    }
    ++p;
    return true;
  };
  auto number = [&](double& v) {
    skipSpaces();
    const auto [next, ec] = std::from_chars(p, end, v);
    p = next;
    return ec == std::errc{};
  };
  Point2D point;
  if (!expect('{') || !number(point.x) || !expect(',') || !number(point.y) || !expect('}') ||
      p != end) {
    return std::nullopt;
  }
  return point;
}

}  // namespace

Point2D KeyedUnarchiver::decodePointForKey(std::string_view key) {
  const Node* node = failed_ ? nullptr : find(key);
  if (node == nullptr || node->type == ArchiveValueType::Null) {
    return {};
  }
  if (node->type != ArchiveValueType::String) {
    failWrongType(key, "a point");
    return {};
  }
  const std::optional<Point2D> point = parsePoint(node->text);
  if (!point) {
    failWithError(
        makeArchiveError(ArchiveError::WrongType, "the key \"" + std::string(key) + "\" of " +
                                                      where() + " holds the string \"" +
                                                      node->text + "\", not a point \"{x, y}\""));
    return {};
  }
  return *point;
}

bool KeyedUnarchiver::readBytes(const Node& node, std::uint8_t* destination) {
  if (node.length == 0) {
    return true;
  }
  if (!in_.seek(node.offset) || !in_.read(destination, static_cast<std::size_t>(node.length))) {
    failWithError(makeArchiveError(ArchiveError::ReadFailed,
                                   "cannot read a byte string of " + where()));
    return false;
  }
  return true;
}

Bytes KeyedUnarchiver::decodeBytesForKey(std::string_view key) {
  const Node* node = failed_ ? nullptr : find(key);
  if (node == nullptr || node->type == ArchiveValueType::Null) {
    return {};
  }
  if (node->type != ArchiveValueType::Bytes) {
    failWrongType(key, "bytes");
    return {};
  }
  // The length was checked against the stream's size when it was parsed.
  Bytes bytes(static_cast<std::size_t>(node->length));
  if (!readBytes(*node, bytes.data())) {
    return {};
  }
  return bytes;
}

std::optional<std::size_t> KeyedUnarchiver::bytesLengthForKey(std::string_view key) const {
  const Node* node = failed_ ? nullptr : find(key);
  if (node == nullptr || node->type != ArchiveValueType::Bytes) {
    return std::nullopt;
  }
  return static_cast<std::size_t>(node->length);
}

bool KeyedUnarchiver::decodeBytesForKeyInto(std::string_view key,
                                            std::span<std::uint8_t> destination) {
  return decodeBytesInto(key, destination, false);
}

bool KeyedUnarchiver::decodeLeadingBytesForKeyInto(std::string_view key,
                                                   std::span<std::uint8_t> destination) {
  return decodeBytesInto(key, destination, true);
}

bool KeyedUnarchiver::decodeBytesInto(std::string_view key, std::span<std::uint8_t> destination,
                                      bool leadingOnly) {
  const Node* node = failed_ ? nullptr : find(key);
  if (node == nullptr || node->type == ArchiveValueType::Null) {
    return false;
  }
  if (node->type != ArchiveValueType::Bytes) {
    failWrongType(key, "bytes");
    return false;
  }
  const bool fits =
      leadingOnly ? node->length >= destination.size() : node->length == destination.size();
  if (!fits) {
    failWithError(makeArchiveError(ArchiveError::WrongType,
                                   "the key \"" + std::string(key) + "\" of " + where() +
                                       " holds " + std::to_string(node->length) +
                                       " bytes, not the " + std::to_string(destination.size()) +
                                       " asked for"));
    return false;
  }
  Node leading = *node;
  leading.length = destination.size();
  return readBytes(leading, destination.data());
}

ObjectPtr KeyedUnarchiver::objectAt(std::size_t index) {
  ObjectRecord& record = objects_[index];
  if (record.state == ObjectRecord::State::Decoded) {
    return record.object;
  }
  if (record.state == ObjectRecord::State::Decoding) {
    failWithError(
        makeArchiveError(ArchiveError::Cycle, "a " + record.className + " contains itself"));
    return nullptr;
  }
  // References can make decoding nest deeper than the archive's own nesting.
  if (decodingObjects_.size() >= static_cast<std::size_t>(kMaxArchiveNesting)) {
    failWithError(makeArchiveError(ArchiveError::TooDeep, "objects refer to each other more than " +
                                                              std::to_string(kMaxArchiveNesting) +
                                                              " deep"));
    return nullptr;
  }
  ObjectPtr object = registry_.make(record.className);
  if (!object) {
    failWithError(makeArchiveError(ArchiveError::UnknownClass,
                                   "the archive holds an object of the unknown class \"" +
                                       record.className + "\""));
    return nullptr;
  }
  record.state = ObjectRecord::State::Decoding;
  reading_.push_back(&record.container);
  decodingObjects_.push_back(index);
  object->initWithCoder(*this);
  decodingObjects_.pop_back();
  reading_.pop_back();
  if (failed_) {
    record.state = ObjectRecord::State::Parsed;
    return nullptr;
  }
  record.object = std::move(object);
  record.state = ObjectRecord::State::Decoded;
  return record.object;
}

ObjectPtr KeyedUnarchiver::objectOrNull(const std::optional<std::size_t>& reference) {
  return reference && !failed_ ? objectAt(*reference) : nullptr;
}

ObjectPtr KeyedUnarchiver::decodeObjectForKey(std::string_view key) {
  const Node* node = failed_ ? nullptr : find(key);
  if (node == nullptr || node->type == ArchiveValueType::Null) {
    return nullptr;
  }
  if (node->type != ArchiveValueType::Object) {
    failWrongType(key, "an object");
    return nullptr;
  }
  return objectAt(node->index);
}

std::optional<std::vector<ObjectPtr>> KeyedUnarchiver::decodeListForKey(std::string_view key) {
  const Node* node = failed_ ? nullptr : find(key);
  if (node == nullptr || node->type == ArchiveValueType::Null) {
    return std::nullopt;
  }
  if (node->type != ArchiveValueType::List) {
    failWrongType(key, "a list");
    return std::nullopt;
  }
  std::vector<ObjectPtr> list;
  for (const auto& element : lists_[node->index]) {
    list.push_back(objectOrNull(element));
  }
  return failed_ ? std::nullopt : std::optional(std::move(list));
}

std::optional<std::map<std::string, ObjectPtr>> KeyedUnarchiver::decodeDictionaryForKey(
    std::string_view key) {
  const Node* node = failed_ ? nullptr : find(key);
  if (node == nullptr || node->type == ArchiveValueType::Null) {
    return std::nullopt;
  }
  if (node->type != ArchiveValueType::Dictionary) {
    failWrongType(key, "a dictionary");
    return std::nullopt;
  }
  std::map<std::string, ObjectPtr> dictionary;
  for (const auto& [name, element] : dictionaries_[node->index]) {
    dictionary.emplace(name, objectOrNull(element));
  }
  return failed_ ? std::nullopt : std::optional(std::move(dictionary));
}

}  // namespace cloudreel
