#include <cbor.h>
#include <gtest/gtest.h>

#include <cfloat>
#include <cmath>
#include <cstring>
#include <fstream>
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

// Keeps a colour as a nested archive, the way layers do.
class Swatch : public Object {
 public:
  std::string_view className() const override { return "Swatch"; }
  void encodeWithCoder(KeyedArchiver& coder) const override {
    coder.encodeBytes(tint->archivedData(), "tint");
  }
  void initWithCoder(KeyedUnarchiver& coder) override {
    Error error;
    tint = Color::colorFromArchivedData(coder.decodeBytesForKey("tint"), &error);
    if (!tint) {
      coder.failWithError(error);
    }
  }
  std::shared_ptr<Color> tint;
};

const ClassRegistry& registry() {
  static const bool registered = [] {
    ClassRegistry::shared().registerClass<Sample>("Sample");
    ClassRegistry::shared().registerClass<Swatch>("Swatch");
    return true;
  }();
  (void)registered;
  return ClassRegistry::shared();
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
#define CBOR_HEAD(name, call)  \
  Cbor& name {                 \
    unsigned char head[9];     \
    return put(call, head);    \
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

// ---------------------------------------------------------------------------

TEST(KeyedArchive, TopLevelValuesRoundTripIncludingExtremes) {
  const std::int64_t integers[] = {0, 1, -1, 23, 24, -24, -25, 255, 256, 65535, 65536,
                                   std::numeric_limits<std::int32_t>::min(),
                                   std::numeric_limits<std::int32_t>::max(), 1LL << 32,
                                   std::numeric_limits<std::int64_t>::min(),
                                   std::numeric_limits<std::int64_t>::max()};
  const double reals[] = {0.0, -0.0, 0.1, -1e300, DBL_MAX, DBL_TRUE_MIN,
                          std::numeric_limits<double>::infinity(),
                          -std::numeric_limits<double>::infinity()};
  const float singles[] = {0.0f, 0.1f, -FLT_MAX, FLT_TRUE_MIN, std::numeric_limits<float>::infinity()};
  const std::string strings[] = {"", "hello", std::string("a\0b", 3), "h\xc3\xa9", std::string(70000, 'x')};
  Bytes binary(256);
  for (std::size_t i = 0; i < binary.size(); ++i) binary[i] = static_cast<std::uint8_t>(i);
  const Bytes blobs[] = {{}, binary, Bytes(100000, 0xab)};

  TopLevel archive([&](KeyedArchiver& a) {
    for (std::size_t i = 0; i < std::size(integers); ++i) a.encodeInt64(integers[i], "i" + std::to_string(i));
    for (std::size_t i = 0; i < std::size(reals); ++i) a.encodeDouble(reals[i], "d" + std::to_string(i));
    for (std::size_t i = 0; i < std::size(singles); ++i) a.encodeFloat(singles[i], "f" + std::to_string(i));
    for (std::size_t i = 0; i < std::size(strings); ++i) a.encodeString(strings[i], "s" + std::to_string(i));
    for (std::size_t i = 0; i < std::size(blobs); ++i) a.encodeBytes(blobs[i], "b" + std::to_string(i));
    a.encodeInt32(std::numeric_limits<std::int32_t>::min(), "int32min");
    a.encodeDouble(std::nan(""), "nan64");
    a.encodeFloat(std::nanf(""), "nan32");
    a.encodeBool(true, "yes");
    a.encodeBool(false, "no");
  });
  KeyedUnarchiver& c = *archive.coder;
  for (std::size_t i = 0; i < std::size(integers); ++i) EXPECT_EQ(c.decodeInt64ForKey("i" + std::to_string(i)), integers[i]);
  for (std::size_t i = 0; i < std::size(reals); ++i) {
    double back = c.decodeDoubleForKey("d" + std::to_string(i));
    EXPECT_EQ(back, reals[i]);
    EXPECT_EQ(std::signbit(back), std::signbit(reals[i]));
  }
  for (std::size_t i = 0; i < std::size(singles); ++i) EXPECT_EQ(c.decodeFloatForKey("f" + std::to_string(i)), singles[i]);
  for (std::size_t i = 0; i < std::size(strings); ++i) EXPECT_EQ(c.decodeStringForKey("s" + std::to_string(i)), strings[i]);
  for (std::size_t i = 0; i < std::size(blobs); ++i) EXPECT_EQ(c.decodeBytesForKey("b" + std::to_string(i)), blobs[i]);
  EXPECT_EQ(c.decodeInt32ForKey("int32min"), std::numeric_limits<std::int32_t>::min());
  EXPECT_TRUE(std::isnan(c.decodeDoubleForKey("nan64")));
  EXPECT_TRUE(std::isnan(c.decodeFloatForKey("nan32")));
  EXPECT_TRUE(c.decodeBoolForKey("yes"));
  EXPECT_FALSE(c.decodeBoolForKey("no"));
  EXPECT_FALSE(c.hasFailed()) << c.error().message;
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
  struct Case {
    const char* what;
    std::function<void(KeyedArchiver&)> encode;
    std::function<void(KeyedUnarchiver&)> decode;
  };
  const Case cases[] = {
      {"int64 beyond int32", [](auto& a) { a.encodeInt64(1LL << 31, "v"); }, [](auto& c) { c.decodeInt32ForKey("v"); }},
      {"float beyond int32", [](auto& a) { a.encodeDouble(3e9, "v"); }, [](auto& c) { c.decodeInt32ForKey("v"); }},
      {"float beyond int64", [](auto& a) { a.encodeDouble(1e19, "v"); }, [](auto& c) { c.decodeInt64ForKey("v"); }},
      {"NaN as integer", [](auto& a) { a.encodeDouble(std::nan(""), "v"); }, [](auto& c) { c.decodeInt64ForKey("v"); }},
      {"string as int", [](auto& a) { a.encodeString("7", "v"); }, [](auto& c) { c.decodeInt32ForKey("v"); }},
      {"string as bool", [](auto& a) { a.encodeString("yes", "v"); }, [](auto& c) { c.decodeBoolForKey("v"); }},
      {"bytes as string", [](auto& a) { a.encodeBytes(Bytes{1}, "v"); }, [](auto& c) { c.decodeStringForKey("v"); }},
      {"int as bytes", [](auto& a) { a.encodeInt32(1, "v"); }, [](auto& c) { c.decodeBytesForKey("v"); }},
      {"list as object", [](auto& a) { a.encodeList(std::vector<ObjectPtr>{}, "v"); }, [](auto& c) { c.decodeObjectForKey("v"); }},
      {"object as list", [](auto& a) { a.encodeObject(sample("x"), "v"); }, [](auto& c) { c.decodeListForKey("v"); }},
      {"object as double", [](auto& a) { a.encodeObject(sample("x"), "v"); }, [](auto& c) { c.decodeDoubleForKey("v"); }},
      {"list as dictionary", [](auto& a) { a.encodeList(std::vector<ObjectPtr>{}, "v"); }, [](auto& c) { c.decodeDictionaryForKey("v"); }},
      {"Color as Sample", [](auto& a) { a.encodeObject(Color::colorWithRGBA(1, 0, 0), "v"); },
       [](KeyedUnarchiver& c) { c.decodeObjectOfClassForKey<Sample>("v"); }},
      {"bytes of another length", [](auto& a) { a.encodeBytes(Bytes(4), "v"); },
       [](auto& c) { Bytes b(5); c.decodeBytesForKeyInto("v", b); }},
  };
  for (const Case& test : cases) {
    SCOPED_TRACE(test.what);
    TopLevel archive([&](KeyedArchiver& a) {
      test.encode(a);
      a.encodeInt32(5, "valid");
    });
    test.decode(*archive.coder);
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
  }
  EXPECT_FALSE(c.containsValueForKey("missing"));
  EXPECT_TRUE(c.containsValueForKey("nothing"));
  EXPECT_EQ(c.allKeys(), std::vector<std::string>{"nothing"});
  EXPECT_FALSE(c.hasFailed());
}

TEST(KeyedArchive, AnObjectReachedTwiceDecodesAsOneObject) {
  auto shared = sample("shared");
  auto root = sample("root");
  root->left = shared;
  root->right = shared;
  root->hasChildren = true;
  root->children = {shared, nullptr, sample("other"), shared};
  root->named = {{"a", shared}, {"none", nullptr}};

  auto back = roundTrip(root);
  ASSERT_NE(back, nullptr);
  ASSERT_NE(back->left, nullptr);
  EXPECT_EQ(back->left->name, "shared");
  EXPECT_EQ(back->left, back->right);
  ASSERT_EQ(back->children.size(), 4u);
  EXPECT_EQ(back->children[0], back->left);
  EXPECT_EQ(back->children[1], nullptr);
  EXPECT_EQ(back->children[2]->name, "other");
  EXPECT_EQ(back->children[3], back->left);
  EXPECT_EQ(back->named.at("a"), back->left);
  EXPECT_EQ(back->named.at("none"), nullptr);
  EXPECT_NE(back->children[2], back->left);
}

TEST(KeyedArchive, EmptyListsAndDictionariesStayPresent) {
  auto root = sample("root");
  root->hasChildren = true;
  auto back = roundTrip(root);
  ASSERT_NE(back, nullptr);
  EXPECT_TRUE(back->hasChildren);
  EXPECT_TRUE(back->children.empty());
  EXPECT_TRUE(back->named.empty());
}

TEST(KeyedArchive, ColorsNestedAsArchivesInsideAnotherObject) {
  auto swatch = std::make_shared<Swatch>();
  swatch->tint = Color::colorWithRGBA(0.25f, 0.5f, 0.75f, 0.1f);
  auto back = roundTrip(swatch);
  ASSERT_NE(back, nullptr);
  ASSERT_NE(back->tint, nullptr);
  EXPECT_EQ(*back->tint, *swatch->tint);
}

TEST(Color, RoundTripsThroughItsArchivedData) {
  const Color colors[] = {{0, 0, 0}, {1, 1, 1, 0}, {0.1f, 0.2f, 0.3f, 0.4f}, {-1, 2, FLT_MAX, 1}};
  for (const Color& color : colors) {
    Error error;
    auto back = Color::colorFromArchivedData(color.archivedData(), &error);
    ASSERT_NE(back, nullptr) << error.message;
    EXPECT_EQ(*back, color);
  }
  EXPECT_EQ(Color::colorWithRGBA(0.5f, 0.5f, 0.5f)->alpha(), 1.0f);
  EXPECT_FALSE(*Color::colorWithRGBA(0.5f, 0.5f, 0.5f) == *Color::colorWithRGBA(0.5f, 0.5f, 0.5f, 0.5f));
}

TEST(Color, RefusesArchivesThatAreNotAColor) {
  Error error;
  EXPECT_EQ(Color::colorFromArchivedData(KeyedArchiver::archivedDataWithRootObject(sample("x")), &error),
            nullptr);
  EXPECT_NE(error.message.find("Sample"), std::string::npos);
  const Bytes garbage = {1, 2, 3};
  EXPECT_EQ(Color::colorFromArchivedData(garbage, &error), nullptr);
  EXPECT_EQ(error.code, static_cast<int>(ArchiveError::NotAnArchive));
}

// The item inside a tag. libcbor answers it with an extra reference, given
// back at once: the tag still holds its own until the whole tree is freed.
cbor_item_t* tagged(cbor_item_t* tag) {
  cbor_item_t* item = cbor_tag_item(tag);
  cbor_item_t* extra = item;
  cbor_decref(&extra);
  return item;
}

TEST(Color, IsWrittenAsAClassNamedColorWithFloat32Components) {
  Bytes data = Color::colorWithRGBA(0.1f, 0.2f, 0.3f)->archivedData();
  cbor_load_result result{};
  cbor_item_t* item = cbor_load(data.data(), data.size(), &result);
  ASSERT_NE(item, nullptr);
  cbor_item_t* top = cbor_array_handle(tagged(item))[2];
  cbor_item_t* color = tagged(cbor_map_handle(top)[0].value);
  cbor_pair* pairs = cbor_map_handle(color);
  ASSERT_EQ(cbor_map_size(color), 5u);
  EXPECT_EQ(std::string(reinterpret_cast<const char*>(cbor_string_handle(pairs[1].key)), 3), "red");
  for (std::size_t i = 1; i < 5; ++i) {
    EXPECT_EQ(cbor_float_get_width(pairs[i].value), CBOR_FLOAT_32);
  }
  EXPECT_EQ(cbor_float_get_float4(pairs[1].value), 0.1f);
  cbor_decref(&item);
}

std::string textOf(cbor_item_t* item) {
  return std::string(reinterpret_cast<const char*>(cbor_string_handle(item)), cbor_string_length(item));
}

TEST(KeyedArchive, OutputIsPlainCborThatAnyToolReads) {
  auto shared = sample("shared");
  auto root = sample("root");
  root->points = {1, 2, 3};
  root->left = shared;
  root->right = shared;
  Bytes data = KeyedArchiver::archivedDataWithRootObject(root);
  ASSERT_GE(data.size(), 3u);
  EXPECT_EQ(data[0], 0xd9);  // tag 55799 in its three-byte form
  EXPECT_EQ(data[1], 0xd9);
  EXPECT_EQ(data[2], 0xf7);

  cbor_load_result result{};
  cbor_item_t* item = cbor_load(data.data(), data.size(), &result);
  ASSERT_NE(item, nullptr);
  EXPECT_EQ(result.read, data.size());
  ASSERT_TRUE(cbor_isa_tag(item));
  EXPECT_EQ(cbor_tag_value(item), 55799u);
  cbor_item_t* header = tagged(item);
  ASSERT_TRUE(cbor_isa_array(header));
  ASSERT_EQ(cbor_array_size(header), 3u);
  cbor_item_t** parts = cbor_array_handle(header);
  EXPECT_EQ(textOf(parts[0]), "cloudreel-archive");
  EXPECT_EQ(cbor_get_int(parts[1]), 1u);
  ASSERT_TRUE(cbor_isa_map(parts[2]));
  cbor_pair* top = cbor_map_handle(parts[2]);
  EXPECT_EQ(textOf(top[0].key), "root");
  ASSERT_EQ(cbor_tag_value(top[0].value), 28u);
  cbor_item_t* object = tagged(top[0].value);
  cbor_pair* entries = cbor_map_handle(object);
  EXPECT_EQ(textOf(entries[0].key), "$class");
  EXPECT_EQ(textOf(entries[0].value), "Sample");
  EXPECT_EQ(textOf(entries[2].key), "points");
  EXPECT_TRUE(cbor_isa_bytestring(entries[2].value));
  EXPECT_TRUE(cbor_bytestring_is_definite(entries[2].value));
  EXPECT_EQ(cbor_tag_value(entries[3].value), 28u);  // left: the first appearance
  EXPECT_EQ(cbor_tag_value(entries[4].value), 29u);  // right: a reference to it
  EXPECT_EQ(cbor_get_int(tagged(entries[4].value)), 1u);  // the second tag 28 value
  cbor_decref(&item);
}

TEST(KeyedArchive, RefusesHostileAndMalformedArchives) {
  auto archive = [] { return Cbor{}.header().indefiniteMap(); };
  struct Case {
    const char* what;
    Bytes data;
    ArchiveError expected;
  };
  const Case cases[] = {
      {"empty", {}, ArchiveError::NotAnArchive},
      {"garbage", {'h', 'e', 'l', 'l', 'o'}, ArchiveError::NotAnArchive},
      {"no self-describe tag", Cbor{}.array(3).text("cloudreel-archive").uint(1).indefiniteMap().end().bytes,
       ArchiveError::NotAnArchive},
      {"another format", Cbor{}.header("other-archive").indefiniteMap().end().bytes, ArchiveError::NotAnArchive},
      {"a newer version", Cbor{}.header("cloudreel-archive", 2).indefiniteMap().end().bytes,
       ArchiveError::UnsupportedVersion},
      {"bytes claiming 2^40", archive().text("b").bytesHead(std::size_t{1} << 40).raw({1, 2}).end().bytes,
       ArchiveError::Truncated},
      {"list claiming 2^60", archive().text("l").array(std::size_t{1} << 60).null().end().bytes,
       ArchiveError::Truncated},
      {"dictionary claiming 2^60", archive().text("d").map(std::size_t{1} << 60).end().bytes,
       ArchiveError::Truncated},
      {"top map claiming 2^60", Cbor{}.header().map(std::size_t{1} << 60).bytes, ArchiveError::Truncated},
      {"reference to a missing object", archive().text("root").tag(29).uint(5).end().bytes,
       ArchiveError::BadReference},
      {"object containing itself", archive().text("root").object("Sample").text("left").tag(29).uint(0).end().end().bytes,
       ArchiveError::Cycle},
      {"unknown class", archive().text("root").object("NoSuchClass").end().end().bytes, ArchiveError::UnknownClass},
      {"object without class", archive().text("root").tag(28).indefiniteMap().text("name").text("x").end().end().bytes,
       ArchiveError::Malformed},
      {"indefinite byte string", archive().text("b").raw({0x5f, 0x41, 0, 0xff}).end().bytes, ArchiveError::Malformed},
      {"indefinite text", archive().text("s").raw({0x7f, 0x61, 'a', 0xff}).end().bytes, ArchiveError::Malformed},
      {"indefinite list", archive().text("l").raw({0x9f, 0xff}).end().bytes, ArchiveError::Malformed},
      {"non-object list element", archive().text("l").array(1).uint(3).end().bytes, ArchiveError::Malformed},
      {"duplicate key", archive().text("a").uint(1).text("a").uint(2).end().bytes, ArchiveError::Malformed},
      {"integer beyond int64", archive().text("i").uint(std::uint64_t{1} << 63).end().bytes, ArchiveError::Malformed},
      {"unexpected tag", archive().text("t").tag(1).uint(0).end().bytes, ArchiveError::Malformed},
      {"undefined", archive().text("u").raw({0xf7}).end().bytes, ArchiveError::Malformed},
      {"reserved head", archive().text("r").raw({0x1c}).end().bytes, ArchiveError::Malformed},
      {"data after the end", archive().end().raw({0}).bytes, ArchiveError::Malformed},
      {"no root", archive().end().bytes, ArchiveError::NoRootObject},
  };
  for (const Case& test : cases) {
    SCOPED_TRACE(test.what);
    Error error = unarchiveError(test.data);
    EXPECT_EQ(error.domain, "CloudreelArchive");
    EXPECT_EQ(error.code, static_cast<int>(test.expected)) << error.message;
    EXPECT_FALSE(error.message.empty());
  }
}

TEST(KeyedArchive, BoundsNestingWhetherWrittenOrReachedThroughReferences) {
  // Objects nested inside one another, beyond the limit.
  Cbor nested = Cbor{}.header().indefiniteMap().text("root");
  for (int i = 0; i < kMaxArchiveNesting + 10; ++i) nested.object("Sample").text("left");
  nested.null();
  for (int i = 0; i < kMaxArchiveNesting + 10; ++i) nested.end();
  EXPECT_EQ(unarchiveError(nested.end().bytes).code, static_cast<int>(ArchiveError::TooDeep));

  // A flat list in which each object refers to the one before: shallow as
  // written, deep when decoded.
  const int count = kMaxArchiveNesting + 10;
  Cbor chain = Cbor{}.header().indefiniteMap().text("all").array(static_cast<std::size_t>(count));
  chain.object("Sample").end();
  for (int i = 1; i < count; ++i) chain.object("Sample").text("left").tag(29).uint(static_cast<std::uint64_t>(i - 1)).end();
  chain.text("root").tag(29).uint(static_cast<std::uint64_t>(count - 1)).end();
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
    Error error;
    EXPECT_EQ(KeyedUnarchiver::unarchiveObjectWithData(std::span(data.data(), size), &error, registry()),
              nullptr);
    EXPECT_FALSE(error.message.empty()) << size;
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

TEST(KeyedArchive, AnObjectMayFailTheWholeDecode) {
  auto root = sample("root");
  root->left = sample("refuse");
  Error error;
  EXPECT_EQ(roundTrip(root, &error), nullptr);
  EXPECT_EQ(error.code, static_cast<int>(ArchiveError::ObjectFailed));
  EXPECT_EQ(error.message, "a Sample refused");
}

TEST(KeyedArchive, ClassesMissingFromTheRegistryAreRefused) {
  ClassRegistry empty;
  Bytes data = Color::colorWithRGBA(1, 0, 0)->archivedData();
  Error error;
  EXPECT_EQ(KeyedUnarchiver::unarchiveObjectWithData(data, &error, empty), nullptr);
  EXPECT_EQ(error.code, static_cast<int>(ArchiveError::UnknownClass));
  EXPECT_NE(error.message.find("Color"), std::string::npos);
}

TEST(KeyedArchiver, RefusesWhatItCannotWriteFaithfully) {
  struct Case {
    const char* what;
    std::function<void(KeyedArchiver&)> encode;
    ArchiveError expected;
  };
  auto selfish = sample("self");
  selfish->left = selfish;
  auto refusing = sample("x");
  refusing->refuseToEncode = true;
  const Case cases[] = {
      {"a key twice", [](auto& a) { a.encodeInt32(1, "k"); a.encodeInt32(2, "k"); }, ArchiveError::ObjectFailed},
      {"the class key", [](auto& a) { a.encodeInt32(1, "$class"); }, ArchiveError::ObjectFailed},
      {"a cycle", [&](auto& a) { a.encodeObject(selfish, "root"); }, ArchiveError::Cycle},
      {"a refusing object", [&](auto& a) { a.encodeObject(refusing, "root"); }, ArchiveError::ObjectFailed},
  };
  for (const Case& test : cases) {
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
  Bytes big(1 << 20);
  archiver.encodeBytes(big, "big");
  EXPECT_FALSE(archiver.finish(&error));
  EXPECT_EQ(error.code, static_cast<int>(ArchiveError::WriteFailed));
}

TEST(KeyedArchive, FilesRoundTripAndBigBytesReadStraightIntoTheirOwner) {
  testing::TempDir dir;
  auto path = dir / "scene.reel";
  auto root = sample("root");
  root->points.resize(300000);
  for (std::size_t i = 0; i < root->points.size(); ++i) root->points[i] = static_cast<std::uint8_t>(i * 7);
  root->hasChildren = true;
  for (int i = 0; i < 2000; ++i) root->children.push_back(sample(std::string(40, 'a' + i % 26)));
  Error error;
  ASSERT_TRUE(KeyedArchiver::archiveRootObjectToFile(root, path, &error)) << error.message;

  auto back = std::dynamic_pointer_cast<Sample>(KeyedUnarchiver::unarchiveObjectWithFile(path, &error, registry()));
  ASSERT_NE(back, nullptr) << error.message;
  EXPECT_EQ(back->points, root->points);
  ASSERT_EQ(back->children.size(), 2000u);
  EXPECT_EQ(back->children[1999]->name, root->children[1999]->name);


  // A blob at the top level of a file, read straight into its owner's own
  // storage, as a point layer does.
  auto blobPath = dir / "blob.reel";
  {
    auto out = FileOutputStream::create(blobPath, &error);
    ASSERT_NE(out, nullptr);
    KeyedArchiver archiver(*out);
    archiver.encodeString("before", "a");
    archiver.encodeBytes(root->points, "points");
    archiver.encodeString("after", "z");
    ASSERT_TRUE(archiver.finish(&error));
    ASSERT_TRUE(out->close());
  }
  auto in = FileInputStream::open(blobPath, &error);
  ASSERT_NE(in, nullptr);
  auto coder = KeyedUnarchiver::open(*in, &error, registry());
  ASSERT_NE(coder, nullptr) << error.message;
  auto length = coder->bytesLengthForKey("points");
  ASSERT_EQ(length, root->points.size());
  Bytes storage(*length);
  EXPECT_TRUE(coder->decodeBytesForKeyInto("points", storage));
  EXPECT_EQ(storage, root->points);
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

  auto back = std::dynamic_pointer_cast<Sample>(KeyedUnarchiver::unarchiveObjectWithFile(path, &error, registry()));
  ASSERT_NE(back, nullptr);
  EXPECT_EQ(back->name, "old");
  int files = 0;
  for ([[maybe_unused]] const auto& entry : std::filesystem::directory_iterator(dir.path())) ++files;
  EXPECT_EQ(files, 1);  // no temporary left behind

  EXPECT_EQ(KeyedUnarchiver::unarchiveObjectWithFile(dir / "missing.reel", &error), nullptr);
  EXPECT_NE(error.message.find("missing.reel"), std::string::npos);
}

}  // namespace
}  // namespace cloudreel
