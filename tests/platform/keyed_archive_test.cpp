#include <cbor.h>
#include <gtest/gtest.h>

#include <cfloat>
#include <cmath>
#include <limits>
#include <random>

#include "platform/byte_stream.h"
#include "platform/class_registry.h"
#include "platform/color.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

// A model-like class holding a value of every archived kind.
class Sample : public Object {
 public:
  std::string_view className() const override { return "Sample"; }
  void encodeWithCoder(KeyedArchiver& coder) const override {
    coder.encodeString(name, "name");
    coder.encodeBytes(points, "points");
    coder.encodeObject(left, "left");
    coder.encodeObject(right, "right");
    if (hasChildren) {
      coder.encodeList(children, "children");
      coder.encodeDictionary(named, "named");
    }
    if (refuseToEncode) {
      coder.failWithError(makeArchiveError(ArchiveError::ObjectFailed, "refused"));
    }
  }
  void initWithCoder(KeyedUnarchiver& coder) override {
    name = coder.decodeStringForKey("name");
    points = coder.decodeBytesForKey("points");
    left = coder.decodeObjectOfClassForKey<Sample>("left");
    right = coder.decodeObjectOfClassForKey<Sample>("right");
    hasChildren = coder.containsValueForKey("children");
    children = coder.decodeListOfClassForKey<Sample>("children").value_or(children);
    named = coder.decodeDictionaryOfClassForKey<Sample>("named").value_or(named);
    if (name == "refuse") {
      coder.failWithError(makeArchiveError(ArchiveError::ObjectFailed, "a Sample refused"));
    }
  }

  std::string name;
  Bytes points;
  std::shared_ptr<Sample> left, right;
  bool hasChildren = false;
  std::vector<std::shared_ptr<Sample>> children;
  std::map<std::string, std::shared_ptr<Sample>> named;
  bool refuseToEncode = false;
};

const ClassRegistry& registry() {
  static ClassRegistry& shared = []() -> ClassRegistry& {
    ClassRegistry::shared().registerClass<Sample>("Sample");
    return ClassRegistry::shared();
  }();
  return shared;
}

std::shared_ptr<Sample> sample(std::string name) {
  auto s = std::make_shared<Sample>();
  s->name = std::move(name);
  return s;
}

template <class T>
std::shared_ptr<T> roundTrip(const std::shared_ptr<T>& root, Error* error = nullptr) {
  Bytes data = KeyedArchiver::archivedDataWithRootObject(root);
  return std::dynamic_pointer_cast<T>(
      KeyedUnarchiver::unarchiveObjectWithData(data, error, registry()));
}

// Archives values written by `encode` at the top level and opens the result.
struct TopLevel {
  explicit TopLevel(const std::function<void(KeyedArchiver&)>& encode) {
    MemoryOutputStream out;
    KeyedArchiver archiver(out);
    encode(archiver);
    EXPECT_TRUE(archiver.finish(nullptr));
    data = out.takeBytes();
    in = std::make_unique<MemoryInputStream>(data);
    Error error;
    coder = KeyedUnarchiver::open(*in, &error, registry());
    EXPECT_NE(coder, nullptr) << error.message;
  }
  Bytes data;
  std::unique_ptr<MemoryInputStream> in;
  std::unique_ptr<KeyedUnarchiver> coder;
};

// Hand-built CBOR for archives the archiver would never write.
struct Cbor {
  Bytes bytes;
  Cbor& put(std::size_t n, const unsigned char* head) {
    bytes.insert(bytes.end(), head, head + n);
    return *this;
  }
#define CBOR_HEAD(name, call) \
  Cbor& name {                \
    unsigned char head[9];    \
    return put(call, head);   \
  }
  CBOR_HEAD(uint(std::uint64_t v), cbor_encode_uint(v, head, 9))
  CBOR_HEAD(tag(std::uint64_t v), cbor_encode_tag(v, head, 9))
  CBOR_HEAD(array(std::size_t n), cbor_encode_array_start(n, head, 9))
  CBOR_HEAD(map(std::size_t n), cbor_encode_map_start(n, head, 9))
  CBOR_HEAD(indefiniteMap(), cbor_encode_indef_map_start(head, 9))
  CBOR_HEAD(end(), cbor_encode_break(head, 9))
  CBOR_HEAD(null(), cbor_encode_null(head, 9))
  CBOR_HEAD(bytesHead(std::size_t n), cbor_encode_bytestring_start(n, head, 9))
#undef CBOR_HEAD
  Cbor& raw(std::initializer_list<std::uint8_t> b) {
    bytes.insert(bytes.end(), b);
    return *this;
  }
  Cbor& text(std::string_view s) {
    unsigned char head[9];
    put(cbor_encode_string_start(s.size(), head, 9), head);
    bytes.insert(bytes.end(), s.begin(), s.end());
    return *this;
  }
  Cbor& header(std::string_view name = "cloudreel-archive", std::uint64_t version = 1) {
    return tag(55799).array(3).text(name).uint(version);
  }
  Cbor& object(std::string_view className) {
    return tag(28).indefiniteMap().text("$class").text(className);
  }
};

Error unarchiveError(const Bytes& data) {
  Error error;
  ObjectPtr root = KeyedUnarchiver::unarchiveObjectWithData(data, &error, registry());
  EXPECT_EQ(root, nullptr);
  return error;
}

// Writes each value under a key of its own at the top level and checks that
// it reads back the same, a float's sign and NaN included.
template <class T, class Encode, class Decode>
void expectEachRoundTrips(std::initializer_list<T> values, Encode encode, Decode decode) {
  const std::vector<T> written(values);
  TopLevel archive([&](KeyedArchiver& a) {
    for (std::size_t i = 0; i < written.size(); ++i) (a.*encode)(written[i], std::to_string(i));
  });
  KeyedUnarchiver& c = *archive.coder;
  for (std::size_t i = 0; i < written.size(); ++i) {
    const T back = (c.*decode)(std::to_string(i));
    if constexpr (std::is_floating_point_v<T>) {
      EXPECT_TRUE(std::isnan(written[i])
                      ? std::isnan(back)
                      : back == written[i] && std::signbit(back) == std::signbit(written[i]))
          << "value " << i << " read back as " << back;
    } else {
      EXPECT_EQ(back, written[i]) << "value " << i;
    }
  }
  EXPECT_FALSE(c.hasFailed()) << c.error().message;
}

TEST(KeyedArchive, TopLevelValuesRoundTripIncludingExtremes) {
  expectEachRoundTrips<std::int64_t>({0, 1, -1, 23, 24, -24, -25, 255, 256, 65535, 65536, INT32_MIN,
                                      INT32_MAX, 1LL << 32, INT64_MIN, INT64_MAX},
                                     &KeyedArchiver::encodeInt64,
                                     &KeyedUnarchiver::decodeInt64ForKey);
  expectEachRoundTrips<std::int32_t>({INT32_MIN, INT32_MAX}, &KeyedArchiver::encodeInt32,
                                     &KeyedUnarchiver::decodeInt32ForKey);
  expectEachRoundTrips<double>(
      {0.0, -0.0, 0.1, -1e300, DBL_MAX, DBL_TRUE_MIN, HUGE_VAL, -HUGE_VAL, std::nan("")},
      &KeyedArchiver::encodeDouble, &KeyedUnarchiver::decodeDoubleForKey);
  expectEachRoundTrips<float>({0.0f, 0.1f, -FLT_MAX, FLT_TRUE_MIN, HUGE_VALF, std::nanf("")},
                              &KeyedArchiver::encodeFloat, &KeyedUnarchiver::decodeFloatForKey);
  expectEachRoundTrips<bool>({true, false}, &KeyedArchiver::encodeBool,
                             &KeyedUnarchiver::decodeBoolForKey);
  expectEachRoundTrips<std::string>(
      {"", "hello", std::string("a\0b", 3), "h\xc3\xa9", std::string(70000, 'x')},
      &KeyedArchiver::encodeString, &KeyedUnarchiver::decodeStringForKey);
  Bytes binary(256);
  for (std::size_t i = 0; i < binary.size(); ++i) binary[i] = static_cast<std::uint8_t>(i);
  expectEachRoundTrips<Bytes>({{}, binary, Bytes(100000, 0xab)}, &KeyedArchiver::encodeBytes,
                              &KeyedUnarchiver::decodeBytesForKey);
}

TEST(KeyedArchive, PointsRoundTripAsTheirShortestDecimalText) {
  const Point2D points[] = {{0.1, -1e-300}, {-0.0, DBL_MAX}, {DBL_TRUE_MIN, -HUGE_VAL}};
  TopLevel archive([&](KeyedArchiver& a) {
    for (std::size_t i = 0; i < 3; ++i) a.encodePoint(points[i], std::to_string(i));
    a.encodeString("{ 0.5 ,2 }", "spaced");
  });
  KeyedUnarchiver& c = *archive.coder;
  for (std::size_t i = 0; i < 3; ++i) EXPECT_EQ(c.decodePointForKey(std::to_string(i)), points[i]);
  EXPECT_TRUE(std::signbit(c.decodePointForKey("1").x));
  EXPECT_EQ(c.decodeStringForKey("0"), "{0.1, -1e-300}");
  EXPECT_EQ(c.decodePointForKey("spaced"), (Point2D{0.5, 2}));
  EXPECT_FALSE(c.hasFailed());
}

TEST(KeyedArchive, NumbersConvertBetweenKinds) {
  TopLevel archive([](KeyedArchiver& a) {
    a.encodeFloat(0.1f, "single");
    a.encodeDouble(0.1, "double");
    a.encodeDouble(-3.9, "negative");
    a.encodeDouble(1e300, "huge");
    a.encodeInt64(7, "seven");
    a.encodeBool(true, "yes");
  });
  KeyedUnarchiver& c = *archive.coder;
  EXPECT_EQ(c.decodeDoubleForKey("single"), 0.10000000149011612);
  EXPECT_EQ(c.decodeFloatForKey("double"), 0.1f);
  EXPECT_EQ(c.decodeInt32ForKey("negative"), -3);  // toward zero
  EXPECT_EQ(c.decodeFloatForKey("huge"), std::numeric_limits<float>::infinity());
  EXPECT_EQ(c.decodeDoubleForKey("seven"), 7.0);
  EXPECT_TRUE(c.decodeBoolForKey("seven"));
  EXPECT_EQ(c.decodeInt32ForKey("yes"), 1);
  EXPECT_FALSE(c.hasFailed());
}

TEST(KeyedArchive, ReadingAValueAsAKindItCannotBeFailsTheDecode) {
  using U = KeyedUnarchiver;
  const std::vector<ObjectPtr> none;
  const struct {
    const char* what;
    std::function<void(KeyedArchiver&)> encode;
    std::function<void(KeyedUnarchiver&, std::string_view)> decode;
  } cases[] = {
      {"int64 beyond int32", [](auto& a) { a.encodeInt64(1LL << 31, "v"); }, &U::decodeInt32ForKey},
      {"float beyond int32", [](auto& a) { a.encodeDouble(3e9, "v"); }, &U::decodeInt32ForKey},
      {"float beyond int64", [](auto& a) { a.encodeDouble(1e19, "v"); }, &U::decodeInt64ForKey},
      {"NaN as integer", [](auto& a) { a.encodeDouble(std::nan(""), "v"); }, &U::decodeInt64ForKey},
      {"string as int", [](auto& a) { a.encodeString("7", "v"); }, &U::decodeInt32ForKey},
      {"string as bool", [](auto& a) { a.encodeString("yes", "v"); }, &U::decodeBoolForKey},
      {"bytes as string", [](auto& a) { a.encodeBytes(Bytes{1}, "v"); }, &U::decodeStringForKey},
      {"int as bytes", [](auto& a) { a.encodeInt32(1, "v"); }, &U::decodeBytesForKey},
      {"list as object", [&](auto& a) { a.encodeList(none, "v"); }, &U::decodeObjectForKey},
      {"object as list", [](auto& a) { a.encodeObject(sample("x"), "v"); }, &U::decodeListForKey},
      {"object as double", [](auto& a) { a.encodeObject(sample("x"), "v"); },
       &U::decodeDoubleForKey},
      {"list as dictionary", [&](auto& a) { a.encodeList(none, "v"); }, &U::decodeDictionaryForKey},
      {"Color as Sample", [](auto& a) { a.encodeObject(Color::colorWithRGBA(1, 0, 0), "v"); },
       &U::decodeObjectOfClassForKey<Sample>},
      {"int as point", [](auto& a) { a.encodeInt32(1, "v"); }, &U::decodePointForKey},
      {"unclosed point", [](auto& a) { a.encodeString("{1, 2", "v"); }, &U::decodePointForKey},
      {"point and more", [](auto& a) { a.encodeString("{1, 2}x", "v"); }, &U::decodePointForKey},
      {"point beyond double", [](auto& a) { a.encodeString("{1e999, 0}", "v"); },
       &U::decodePointForKey},
      {"bytes of another length", [](auto& a) { a.encodeBytes(Bytes(4), "v"); },
       [](U& c, std::string_view key) {
         Bytes b(5);
         c.decodeBytesForKeyInto(key, b);
       }},
  };
  for (const auto& test : cases) {
    SCOPED_TRACE(test.what);
    TopLevel archive([&](KeyedArchiver& a) {
      test.encode(a);
      a.encodeInt32(5, "valid");
    });
    test.decode(*archive.coder, "v");
    ASSERT_TRUE(archive.coder->hasFailed());
    EXPECT_EQ(archive.coder->error().domain, "CloudreelArchive");
    EXPECT_EQ(archive.coder->error().code, static_cast<int>(ArchiveError::WrongType));
    EXPECT_NE(archive.coder->error().message.find("\"v\""), std::string::npos);
    EXPECT_EQ(archive.coder->decodeInt32ForKey("valid"), 0);  // failed decodes answer zero
  }
}

TEST(KeyedArchive, MissingAndNullKeysReadAsZeroValues) {
  TopLevel archive([](KeyedArchiver& a) { a.encodeObject(nullptr, "nothing"); });
  KeyedUnarchiver& c = *archive.coder;
  for (const char* key : {"missing", "nothing"}) {
    EXPECT_EQ(c.decodeInt32ForKey(key), 0);
    EXPECT_EQ(c.decodeInt64ForKey(key), 0);
    EXPECT_EQ(c.decodeFloatForKey(key), 0.0f);
    EXPECT_EQ(c.decodeDoubleForKey(key), 0.0);
    EXPECT_FALSE(c.decodeBoolForKey(key));
    EXPECT_EQ(c.decodeStringForKey(key), "");
    EXPECT_TRUE(c.decodeBytesForKey(key).empty());
    EXPECT_EQ(c.decodeObjectForKey(key), nullptr);
    EXPECT_FALSE(c.decodeListForKey(key).has_value());
    EXPECT_FALSE(c.decodeDictionaryForKey(key).has_value());
    EXPECT_FALSE(c.bytesLengthForKey(key).has_value());
    EXPECT_EQ(c.typeOfValueForKey(key), ArchiveValueType::Null);
    EXPECT_EQ(c.decodePointForKey(key), Point2D{});
  }
  EXPECT_FALSE(c.containsValueForKey("missing"));
  EXPECT_TRUE(c.containsValueForKey("nothing"));
  EXPECT_EQ(c.allKeys(), std::vector<std::string>{"nothing"});
  EXPECT_FALSE(c.hasFailed());
}

TEST(KeyedArchive, AnObjectReachedTwiceDecodesAsOneObjectAndEmptyCollectionsStay) {
  auto shared = sample("shared");
  auto other = sample("other");
  other->hasChildren = true;  // an empty list and an empty dictionary
  auto root = sample("root");
  root->left = shared;
  root->right = shared;
  root->hasChildren = true;
  root->children = {shared, nullptr, other, shared};
  root->named = {{"a", shared}, {"none", nullptr}};

  auto back = roundTrip(root);
  ASSERT_NE(back, nullptr);
  ASSERT_NE(back->left, nullptr);
  EXPECT_EQ(back->left->name, "shared");
  EXPECT_EQ(back->left, back->right);
  ASSERT_EQ(back->children.size(), 4u);
  EXPECT_EQ(back->children[0], back->left);
  EXPECT_EQ(back->children[1], nullptr);
  EXPECT_EQ(back->children[3], back->left);
  EXPECT_EQ(back->named.at("a"), back->left);
  EXPECT_EQ(back->named.at("none"), nullptr);
  ASSERT_EQ(back->children[2]->name, "other");
  EXPECT_TRUE(back->children[2]->hasChildren);
  EXPECT_TRUE(back->children[2]->children.empty());
  EXPECT_TRUE(back->children[2]->named.empty());
}

// The item inside a tag. libcbor answers it with an extra reference, given
// back at once: the tag still holds its own until the whole tree is freed.
cbor_item_t* tagged(cbor_item_t* tag) {
  cbor_item_t* item = cbor_tag_item(tag);
  cbor_item_t* extra = item;
  cbor_decref(&extra);
  return item;
}

std::string textOf(cbor_item_t* item) {
  return {reinterpret_cast<const char*>(cbor_string_handle(item)), cbor_string_length(item)};
}

// Parsed with libcbor, as any other tool would; freed when it goes.
struct Parsed {
  explicit Parsed(const Bytes& data) : item(cbor_load(data.data(), data.size(), &result)) {}
  ~Parsed() {
    if (item != nullptr) cbor_decref(&item);
  }
  // The top-level map of a well-formed archive.
  cbor_item_t* top() const { return cbor_array_handle(tagged(item))[2]; }
  cbor_load_result result{};
  cbor_item_t* item;
};

TEST(Color, RoundTripsAsAClassNamedColorWithFloat32ComponentsAndRefusesOtherArchives) {
  const Color colors[] = {{0, 0, 0}, {1, 1, 1, 0}, {0.1f, 0.2f, 0.3f, 0.4f}, {-1, 2, FLT_MAX, 1}};
  Error error;
  for (const Color& color : colors) {
    auto back = Color::colorFromArchivedData(color.archivedData(), &error);
    ASSERT_NE(back, nullptr) << error.message;
    EXPECT_EQ(*back, color);
  }
  EXPECT_FALSE(Color(1, 1, 1, 0) == Color(1, 1, 1, 1));  // alpha counts

  const Parsed parsed(Color::colorWithRGBA(0.1f, 0.2f, 0.3f)->archivedData());
  ASSERT_NE(parsed.item, nullptr);
  cbor_item_t* color = tagged(cbor_map_handle(parsed.top())[0].value);
  cbor_pair* pairs = cbor_map_handle(color);
  ASSERT_EQ(cbor_map_size(color), 5u);
  EXPECT_EQ(textOf(pairs[0].value), "Color");
  EXPECT_EQ(textOf(pairs[1].key), "red");
  for (std::size_t i = 1; i < 5; ++i) {
    EXPECT_EQ(cbor_float_get_width(pairs[i].value), CBOR_FLOAT_32);
  }
  EXPECT_EQ(cbor_float_get_float4(pairs[1].value), 0.1f);

  const Bytes notAColor = KeyedArchiver::archivedDataWithRootObject(sample("x"));
  EXPECT_EQ(Color::colorFromArchivedData(notAColor, &error), nullptr);
  EXPECT_NE(error.message.find("Sample"), std::string::npos);
  EXPECT_EQ(Color::colorFromArchivedData(Bytes{1, 2, 3}, &error), nullptr);
  EXPECT_EQ(error.code, static_cast<int>(ArchiveError::NotAnArchive));
}

TEST(KeyedArchive, OutputIsPlainCborThatAnyToolReads) {
  auto shared = sample("shared");
  auto root = sample("root");
  root->points = {1, 2, 3};
  root->left = shared;
  root->right = shared;
  const Bytes data = KeyedArchiver::archivedDataWithRootObject(root);
  ASSERT_GE(data.size(), 3u);
  // Tag 55799 in its three-byte form.
  ASSERT_EQ(Bytes(data.begin(), data.begin() + 3), (Bytes{0xd9, 0xd9, 0xf7}));

  const Parsed parsed(data);
  ASSERT_NE(parsed.item, nullptr);
  EXPECT_EQ(parsed.result.read, data.size());
  cbor_item_t* header = tagged(parsed.item);
  ASSERT_TRUE(cbor_isa_array(header));
  ASSERT_EQ(cbor_array_size(header), 3u);
  cbor_item_t** parts = cbor_array_handle(header);
  EXPECT_EQ(textOf(parts[0]), "cloudreel-archive");
  EXPECT_EQ(cbor_get_int(parts[1]), 1u);
  ASSERT_TRUE(cbor_isa_map(parts[2]));
  cbor_pair* top = cbor_map_handle(parts[2]);
  EXPECT_EQ(textOf(top[0].key), "root");
  ASSERT_EQ(cbor_tag_value(top[0].value), 28u);
  cbor_pair* entries = cbor_map_handle(tagged(top[0].value));
  EXPECT_EQ(textOf(entries[0].key), "$class");
  EXPECT_EQ(textOf(entries[0].value), "Sample");
  EXPECT_EQ(textOf(entries[2].key), "points");
  EXPECT_TRUE(cbor_isa_bytestring(entries[2].value));
  EXPECT_TRUE(cbor_bytestring_is_definite(entries[2].value));
  EXPECT_EQ(cbor_tag_value(entries[3].value), 28u);       // left: the first appearance
  EXPECT_EQ(cbor_tag_value(entries[4].value), 29u);       // right: a reference to it
  EXPECT_EQ(cbor_get_int(tagged(entries[4].value)), 1u);  // the second tag 28 value
}

TEST(KeyedArchive, RefusesHostileAndMalformedArchives) {
  using E = ArchiveError;
  auto archive = [] { return Cbor{}.header().indefiniteMap(); };
  const std::size_t huge = std::size_t{1} << 60;
  const struct {
    const char* what;
    Cbor data;
    ArchiveError expected;
  } cases[] = {
      {"empty", {}, E::NotAnArchive},
      {"garbage", Cbor{}.raw({'h', 'e', 'l', 'l', 'o'}), E::NotAnArchive},
      {"no self-describe tag",
       Cbor{}.array(3).text("cloudreel-archive").uint(1).indefiniteMap().end(), E::NotAnArchive},
      {"another format", Cbor{}.header("other-archive").indefiniteMap().end(), E::NotAnArchive},
      {"a newer version", Cbor{}.header("cloudreel-archive", 2).indefiniteMap().end(),
       E::UnsupportedVersion},
      {"bytes claiming 2^40", archive().text("b").bytesHead(std::size_t{1} << 40).raw({1, 2}).end(),
       E::Truncated},
      {"list claiming 2^60", archive().text("l").array(huge).null().end(), E::Truncated},
      {"dictionary claiming 2^60", archive().text("d").map(huge).end(), E::Truncated},
      {"top map claiming 2^60", Cbor{}.header().map(huge), E::Truncated},
      {"reference to a missing object", archive().text("root").tag(29).uint(5).end(),
       E::BadReference},
      {"object containing itself",
       archive().text("root").object("Sample").text("left").tag(29).uint(0).end().end(), E::Cycle},
      {"unknown class", archive().text("root").object("NoSuchClass").end().end(), E::UnknownClass},
      {"object without class",
       archive().text("root").tag(28).indefiniteMap().text("name").text("x").end().end(),
       E::Malformed},
      {"indefinite byte string", archive().text("b").raw({0x5f, 0x41, 0, 0xff}).end(),
       E::Malformed},
      {"indefinite text", archive().text("s").raw({0x7f, 0x61, 'a', 0xff}).end(), E::Malformed},
      {"indefinite list", archive().text("l").raw({0x9f, 0xff}).end(), E::Malformed},
      {"non-object list element", archive().text("l").array(1).uint(3).end(), E::Malformed},
      {"duplicate key", archive().text("a").uint(1).text("a").uint(2).end(), E::Malformed},
      {"integer beyond int64", archive().text("i").uint(std::uint64_t{1} << 63).end(),
       E::Malformed},
      {"unexpected tag", archive().text("t").tag(1).uint(0).end(), E::Malformed},
      {"undefined", archive().text("u").raw({0xf7}).end(), E::Malformed},
      {"reserved head", archive().text("r").raw({0x1c}).end(), E::Malformed},
      {"data after the end", archive().end().raw({0}), E::Malformed},
      {"no root", archive().end(), E::NoRootObject},
  };
  for (const auto& test : cases) {
    SCOPED_TRACE(test.what);
    Error error = unarchiveError(test.data.bytes);
    EXPECT_EQ(error.domain, "CloudreelArchive");
    EXPECT_EQ(error.code, static_cast<int>(test.expected)) << error.message;
    EXPECT_FALSE(error.message.empty());
  }
}

TEST(KeyedArchive, BoundsNestingWhetherWrittenOrReachedThroughReferences) {
  constexpr std::uint64_t count = kMaxArchiveNesting + 10;
  // Objects nested inside one another, beyond the limit.
  Cbor nested = Cbor{}.header().indefiniteMap().text("root");
  for (std::uint64_t i = 0; i < count; ++i) nested.object("Sample").text("left");
  nested.null();
  for (std::uint64_t i = 0; i < count; ++i) nested.end();
  EXPECT_EQ(unarchiveError(nested.end().bytes).code, static_cast<int>(ArchiveError::TooDeep));

  // A flat list in which each object refers to the one before: shallow as
  // written, deep when decoded.
  Cbor chain = Cbor{}.header().indefiniteMap().text("all").array(count);
  chain.object("Sample").end();
  for (std::uint64_t i = 1; i < count; ++i)
    chain.object("Sample").text("left").tag(29).uint(i - 1).end();
  chain.text("root").tag(29).uint(count - 1).end();
  EXPECT_EQ(unarchiveError(chain.bytes).code, static_cast<int>(ArchiveError::TooDeep));

  // And the archiver refuses to write what could not be read.
  auto deep = sample("0");
  for (int i = 0; i < kMaxArchiveNesting; ++i) {
    auto parent = sample("n");
    parent->left = deep;
    deep = parent;
  }
  MemoryOutputStream out;
  KeyedArchiver archiver(out);
  archiver.encodeObject(deep, "root");
  Error error;
  EXPECT_FALSE(archiver.finish(&error));
  EXPECT_EQ(error.code, static_cast<int>(ArchiveError::TooDeep));
}

TEST(KeyedArchive, EveryTruncationAndCorruptionFailsCleanly) {
  auto root = sample("root");
  root->points = {1, 2, 3, 4};
  root->left = sample("left");
  root->right = root->left;
  root->hasChildren = true;
  root->children = {root->left, sample("c")};
  root->named = {{"k", root->left}};
  const Bytes data = KeyedArchiver::archivedDataWithRootObject(root);
  for (std::size_t size = 0; size < data.size(); ++size) {
    EXPECT_FALSE(unarchiveError(Bytes(data.begin(), data.begin() + size)).message.empty()) << size;
  }
  // Random corruption must either decode or fail with an error, never crash.
  std::mt19937 random(12345);
  for (int trial = 0; trial < 3000; ++trial) {
    Bytes corrupt = data;
    for (int n = 0; n < 3; ++n) {
      corrupt[random() % corrupt.size()] = static_cast<std::uint8_t>(random());
    }
    Error error;
    ObjectPtr back = KeyedUnarchiver::unarchiveObjectWithData(corrupt, &error, registry());
    EXPECT_TRUE(back != nullptr || !error.message.empty());
  }
}

TEST(KeyedArchive, AnObjectOrAMissingClassFailsTheWholeDecodeWithTheReason) {
  auto root = sample("root");
  root->left = sample("refuse");
  Error error;
  EXPECT_EQ(roundTrip(root, &error), nullptr);
  EXPECT_EQ(error.code, static_cast<int>(ArchiveError::ObjectFailed));
  EXPECT_EQ(error.message, "a Sample refused");

  const ClassRegistry empty;
  const Bytes red = Color::colorWithRGBA(1, 0, 0)->archivedData();
  EXPECT_EQ(KeyedUnarchiver::unarchiveObjectWithData(red, &error, empty), nullptr);
  EXPECT_EQ(error.code, static_cast<int>(ArchiveError::UnknownClass));
  EXPECT_NE(error.message.find("Color"), std::string::npos);
}

TEST(KeyedArchiver, RefusesWhatItCannotWriteFaithfully) {
  auto selfish = sample("self");
  selfish->left = selfish;
  auto refusing = sample("x");
  refusing->refuseToEncode = true;
  const struct {
    const char* what;
    std::function<void(KeyedArchiver&)> encode;
    ArchiveError expected;
  } cases[] = {
      {"a key twice",
       [](auto& a) {
         a.encodeInt32(1, "k");
         a.encodeInt32(2, "k");
       },
       ArchiveError::ObjectFailed},
      {"the class key", [](auto& a) { a.encodeInt32(1, "$class"); }, ArchiveError::ObjectFailed},
      {"a cycle", [&](auto& a) { a.encodeObject(selfish, "root"); }, ArchiveError::Cycle},
      {"a refusing object", [&](auto& a) { a.encodeObject(refusing, "root"); },
       ArchiveError::ObjectFailed},
  };
  for (const auto& test : cases) {
    SCOPED_TRACE(test.what);
    MemoryOutputStream out;
    KeyedArchiver archiver(out);
    test.encode(archiver);
    Error error;
    EXPECT_FALSE(archiver.finish(&error));
    EXPECT_EQ(error.code, static_cast<int>(test.expected));
  }
  selfish->left = nullptr;  // break the cycle so the test does not leak
}

TEST(KeyedArchiver, ReportsAFailedWrite) {
  Error error;
  auto full = FileOutputStream::create("/dev/full", &error);
  ASSERT_NE(full, nullptr) << error.message;
  KeyedArchiver archiver(*full);
  archiver.encodeBytes(Bytes(1 << 20), "big");
  EXPECT_FALSE(archiver.finish(&error));
  EXPECT_EQ(error.code, static_cast<int>(ArchiveError::WriteFailed));
}

std::shared_ptr<Sample> unarchiveFile(const std::filesystem::path& path, Error* error) {
  return std::dynamic_pointer_cast<Sample>(
      KeyedUnarchiver::unarchiveObjectWithFile(path, error, registry()));
}

TEST(KeyedArchive, FilesRoundTripAndBigBytesReadStraightIntoTheirOwner) {
  testing::TempDir dir;
  const auto path = dir / "scene.reel";
  auto root = sample("root");
  root->hasChildren = true;
  for (int i = 0; i < 2000; ++i) root->children.push_back(sample(std::string(40, 'a' + i % 26)));
  Bytes blob(300000);
  for (std::size_t i = 0; i < blob.size(); ++i) blob[i] = std::uint8_t(i * 7);
  root->points = blob;
  Error error;
  {
    auto out = FileOutputStream::create(path, &error);
    ASSERT_NE(out, nullptr);
    KeyedArchiver archiver(*out);
    archiver.encodeObject(root, "root");
    archiver.encodeBytes(blob, "points");
    archiver.encodeString("after", "z");
    ASSERT_TRUE(archiver.finish(&error));
    ASSERT_TRUE(out->close());
  }
  auto back = unarchiveFile(path, &error);
  ASSERT_NE(back, nullptr) << error.message;
  EXPECT_EQ(back->points, blob);
  ASSERT_EQ(back->children.size(), 2000u);
  EXPECT_EQ(back->children[1999]->name, root->children[1999]->name);

  // The blob at the top level, read straight into its owner's own storage,
  // as a point layer does.
  auto in = FileInputStream::open(path, &error);
  ASSERT_NE(in, nullptr);
  auto coder = KeyedUnarchiver::open(*in, &error, registry());
  ASSERT_NE(coder, nullptr) << error.message;
  ASSERT_EQ(coder->bytesLengthForKey("points"), blob.size());
  Bytes storage(blob.size());
  EXPECT_TRUE(coder->decodeBytesForKeyInto("points", storage));
  EXPECT_EQ(storage, blob);
  EXPECT_EQ(coder->decodeStringForKey("z"), "after");
}

TEST(KeyedArchive, AFailedSaveLeavesThePreviousFileIntact) {
  testing::TempDir dir;
  auto path = dir / "scene.reel";
  Error error;
  ASSERT_TRUE(KeyedArchiver::archiveRootObjectToFile(sample("old"), path, &error));
  auto refusing = sample("new");
  refusing->refuseToEncode = true;
  EXPECT_FALSE(KeyedArchiver::archiveRootObjectToFile(refusing, path, &error));
  EXPECT_NE(error.message.find(path.string()), std::string::npos);

  auto back = unarchiveFile(path, &error);
  ASSERT_NE(back, nullptr);
  EXPECT_EQ(back->name, "old");
  // No temporary left behind.
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(dir.path()), {}), 1);

  EXPECT_EQ(unarchiveFile(dir / "missing.reel", &error), nullptr);
  EXPECT_NE(error.message.find("missing.reel"), std::string::npos);
}

}  // namespace
}  // namespace cloudreel
