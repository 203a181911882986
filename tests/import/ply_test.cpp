#include "import/ply/ply.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <random>
#include <string>
#include <vector>

#include "support/ply_text.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

using testing::PlyElement;
using testing::plyText;

// One callback call: `key` is element index * 100 + property index.
struct Call {
  long key, instance, length, valueIndex;
  double value;
  friend bool operator==(const Call&, const Call&) = default;
};

struct Outcome {
  bool ok = false;
  std::vector<Call> calls;
  std::vector<std::string> errors;
  std::size_t stopAfter = SIZE_MAX;  // the callback answers 0 at this call
};

void recordError(p_ply ply, const char* message) {
  void* outcome = nullptr;
  ply_get_ply_user_data(ply, &outcome, nullptr);
  static_cast<Outcome*>(outcome)->errors.push_back(message);
}

int recordCall(p_ply_argument argument) {
  void* pdata = nullptr;
  long key = 0;
  ply_get_argument_user_data(argument, &pdata, &key);
  auto& outcome = *static_cast<Outcome*>(pdata);
  Call call{key, 0, 0, 0, ply_get_argument_value(argument)};
  ply_get_argument_element(argument, nullptr, &call.instance);
  ply_get_argument_property(argument, nullptr, &call.length, &call.valueIndex);
  outcome.calls.push_back(call);
  return outcome.calls.size() != outcome.stopAfter;
}

// Registers the callback for every property except those of `skipped`.
Outcome readPly(p_ply ply, Outcome& outcome, const std::string& skipped = "") {
  if (ply && ply_read_header(ply)) {
    long e = 0;
    for (p_ply_element element = nullptr; (element = ply_get_next_element(ply, element)); ++e) {
      const char* elementName = nullptr;
      ply_get_element_info(element, &elementName, nullptr);
      long p = 0;
      for (p_ply_property property = nullptr; (property = ply_get_next_property(element, property));
           ++p) {
        const char* name = nullptr;
        ply_get_property_info(property, &name, nullptr, nullptr, nullptr);
        if (skipped != elementName) {
          ply_set_read_cb(ply, elementName, name, recordCall, &outcome, e * 100 + p);
        }
      }
    }
    outcome.ok = ply_read(ply);
  }
  ply_close(ply);
  return outcome;
}

Outcome readFile(const std::filesystem::path& path, const std::string& skipped = "",
                 std::size_t stopAfter = SIZE_MAX) {
  Outcome outcome;
  outcome.stopAfter = stopAfter;
  return readPly(ply_open(path.c_str(), recordError, 0, &outcome), outcome, skipped);
}

// Writes `bytes` as the one PLY file a test reads at a time. Reading the
// same bytes from memory is compared with this by the fuzz target.
std::filesystem::path plyFile(const std::string& bytes) {
  static const testing::TempDir dir;
  return testing::writeFile(dir / "test.ply", bytes);
}

// The calls a read of every property makes, by the list protocol.
std::vector<Call> expectedCalls(const std::vector<PlyElement>& elements,
                                const std::string& skipped) {
  std::vector<Call> calls;
  for (long e = 0; e < long(elements.size()); ++e) {
    const auto& element = elements[std::size_t(e)];
    for (long i = 0; i < long(element.instances.size()) && element.name != skipped; ++i) {
      const auto& values = element.instances[std::size_t(i)];
      std::size_t v = 0;
      for (long p = 0; p < long(element.properties.size()); ++p) {
        if (element.properties[std::size_t(p)].lengthType.empty()) {
          calls.push_back({e * 100 + p, i, 1, 0, values[v++]});
          continue;
        }
        long n = long(values[v]);
        calls.push_back({e * 100 + p, i, n, -1, values[v++]});
        for (long k = 0; k < n; ++k) calls.push_back({e * 100 + p, i, n, k, values[v++]});
      }
    }
  }
  return calls;
}

const std::vector<std::string> kFormats = {"ascii", "binary_little_endian", "binary_big_endian"};

// Enough vertices that binary and ASCII data cross the reader's block
// boundaries, then faces with lists (one empty), then a last element that
// is read correctly only if the faces were passed over correctly.
std::vector<PlyElement> sampleScene(int vertices) {
  std::mt19937 random(7);
  std::uniform_real_distribution<float> coordinate(-1000.0f, 1000.0f);
  PlyElement vertex{"vertex", testing::kPlyXyzRgb, {}};
  for (int i = 0; i < vertices; ++i) {
    vertex.instances.push_back({coordinate(random), coordinate(random), coordinate(random),
                                double(i % 256), double(random() % 256), 255});
  }
  PlyElement face{"face",
                  {{"int", "vertex_indices", "uchar"}, {"uchar", "flags"}},
                  {{3, 0, 1, 2, 7}, {0, 8}, {4, 3, 2, 1, 0, 9}}};
  PlyElement edge{"edge", {{"int", "vertex1"}, {"int", "vertex2"}}, {{-5, 2147483647}}};
  return {vertex, face, edge};
}

TEST(PlyReader, ReadsTheSameScenesInEveryFormatWithListsReadOrSkipped) {
  const auto scene = sampleScene(20000);
  for (const auto& format : kFormats) {
    const auto path = plyFile(plyText(scene, format));
    for (std::string skipped : {"", "face"}) {
      SCOPED_TRACE(format + " skipping '" + skipped + "'");
      const Outcome outcome = readFile(path, skipped);
      EXPECT_TRUE(outcome.ok && outcome.errors.empty());
      EXPECT_TRUE(outcome.calls == expectedCalls(scene, skipped));
    }
  }
}

TEST(PlyReader, ReadsEveryScalarTypeUnderBothNames) {
  struct Row {
    const char* name;
    e_ply_type type;
    double value;
  } rows[] = {
      {"char", PLY_CHAR, -128},           {"int8", PLY_INT8, 127},
      {"uchar", PLY_UCHAR, 255},          {"uint8", PLY_UINT8, 128},
      {"short", PLY_SHORT, -32768},       {"int16", PLY_INT16, 32767},
      {"ushort", PLY_USHORT, 65535},      {"uint16", PLY_UINT16, 1},
      {"int", PLY_INT, -2147483648.0},    {"int32", PLY_INT32, 2147483647},
      {"uint", PLY_UINT, 4294967295.0},   {"uint32", PLY_UINT32, 3},
      {"float", PLY_FLOAT, double(0.1f)}, {"float32", PLY_FLOAT32, -3.4028234663852886e38},
      {"double", PLY_DOUBLE, 0.1},        {"float64", PLY_FLOAT64, -1e-300},
  };
  PlyElement sample{"sample", {}, {{}}};
  for (const Row& row : rows) {
    sample.properties.push_back({row.name, std::string("p_") + row.name});
    sample.instances[0].push_back(row.value);
  }
  for (const auto& format : kFormats) {
    SCOPED_TRACE(format);
    const auto path = plyFile(plyText({sample}, format));
    Outcome outcome = readFile(path);
    EXPECT_TRUE(outcome.calls == expectedCalls({sample}, ""));
    PlyHandle ply(ply_open(path.c_str(), recordError, 0, &outcome));
    ASSERT_TRUE(ply_read_header(ply.get()));
    p_ply_property property = nullptr;
    for (const Row& row : rows) {
      property = ply_get_next_property(ply_get_next_element(ply.get(), nullptr), property);
      e_ply_type type = PLY_LIST;
      ply_get_property_info(property, nullptr, &type, nullptr, nullptr);
      EXPECT_EQ(type, row.type) << row.name;
      EXPECT_STREQ(ply_type_name(type), row.name);
    }
  }
}

// A header with CR LF line ends, comments, obj_info and an element without
// instances, in ASCII (whose data has CR LF too) and in binary.
TEST(PlyReader, ReadsHeaderDetailsAndCrLfLineEnds) {
  std::vector<PlyElement> scene = {{"vertex", {{"float", "x"}, {"int", "id"}}, {{1.5, 7}, {-2, 8}}},
                                   {"camera", {{"float", "fov"}}, {}},
                                   {"face", {{"int", "vertex_indices", "uchar"}}, {{2, 0, 1}}}};
  for (const char* format : {"ascii", "binary_big_endian"}) {
    SCOPED_TRACE(format);
    const auto path = plyFile(
        plyText(scene, format, "\r\n", "comment made by hand\r\nobj_info x\r\ncomment\r\n"));
    Outcome outcome = readFile(path);
    EXPECT_TRUE(outcome.ok);
    EXPECT_TRUE(outcome.calls == expectedCalls(scene, ""));

    PlyHandle ply(ply_open(path.c_str(), recordError, 0, &outcome));
    ASSERT_TRUE(ply_read_header(ply.get()));
    EXPECT_STREQ(ply_storage_mode_name(ply_get_storage_mode(ply.get())), format);
    const char* comment = ply_get_next_comment(ply.get(), nullptr);
    EXPECT_STREQ(comment, "made by hand");
    EXPECT_STREQ(ply_get_next_comment(ply.get(), comment), "");
    EXPECT_STREQ(ply_get_next_obj_info(ply.get(), nullptr), "x");
    EXPECT_EQ(ply_get_next_comment(ply.get(), ply_get_next_comment(ply.get(), comment)), nullptr);
    EXPECT_EQ(ply_set_read_cb(ply.get(), "vertex", "id", recordCall, &outcome, 0), 2);
    EXPECT_EQ(ply_set_read_cb(ply.get(), "camera", "fov", recordCall, &outcome, 0), 0);
    EXPECT_EQ(ply_set_read_cb(ply.get(), "vertex", "fov", recordCall, &outcome, 0), 0);
    EXPECT_EQ(ply_set_read_cb(ply.get(), "edge", "x", recordCall, &outcome, 0), 0);
  }
}

TEST(PlyReader, ReadsAsciiValuesAsOtherWritersWriteThem) {
  struct Case {
    const char* type;
    const char* text;
    double value;
  } cases[] = {
      {"float", "+1.5", 1.5},
      {"float", "1e-40", double(1e-40f)},
      {"float", "1e-50", 0.0},
      {"float", "-1e39", -std::numeric_limits<double>::infinity()},
      {"double", "-.5e-3", -0.0005},
      {"uchar", "300", 300},
      {"int", "+7", 7},
  };
  for (const Case& c : cases) {
    const Outcome outcome =
        readFile(plyFile(std::string("ply\nformat ascii 1.0\nelement v 1\n") + "property " +
                         c.type + " x\nend_header\n" + c.text + "\r\n"));
    ASSERT_EQ(outcome.calls.size(), 1u) << c.text;
    EXPECT_EQ(outcome.calls[0].value, c.value) << c.text;
  }
}

TEST(PlyReader, StopsWhenACallbackAnswersZero) {
  for (const auto& format : kFormats) {
    const Outcome outcome = readFile(plyFile(plyText(sampleScene(10), format)), "", 3);
    EXPECT_FALSE(outcome.ok) << format;
    EXPECT_EQ(outcome.calls.size(), 3u) << format;
    ASSERT_EQ(outcome.errors.size(), 1u) << format;
    EXPECT_NE(outcome.errors[0].find("stopped by the callback"), std::string::npos);
  }
}

// What a block callback saw: the bytes in the order they came, and whether
// each block began where the last ended.
struct Blocks {
  std::string bytes;
  long next = 0;
  bool contiguous = true;
  int calls = 0;
  int stopAt = -1;
};

int keepBlock(const void* data, long first, long count, void* pdata) {
  auto& blocks = *static_cast<Blocks*>(pdata);
  blocks.contiguous = blocks.contiguous && first == blocks.next && count > 0;
  blocks.next = first + count;
  blocks.bytes.append(static_cast<const char*>(data), std::size_t(count) * 15);
  return ++blocks.calls != blocks.stopAt;
}

// A list-free binary element reaches a block callback whole, as the file
// stores it, over as many blocks as the buffer needs; the elements around
// it are still read or passed over as usual. An ASCII file or an element
// with lists has no blocks to give, and a block callback answering 0 stops
// the read.
TEST(PlyReader, HandsListFreeBinaryElementsOverInBlocks) {
  const auto scene = sampleScene(70000);  // 15-byte vertices, faces with lists, an edge
  for (const std::string format : {"binary_little_endian", "binary_big_endian"}) {
    SCOPED_TRACE(format);
    const std::string file = plyText(scene, format);
    const auto path = plyFile(file);
    Outcome outcome;
    Blocks blocks;
    PlyHandle ply(ply_open(path.c_str(), recordError, 0, &outcome));
    ASSERT_TRUE(ply_read_header(ply.get()));
    EXPECT_EQ(ply_set_block_cb(ply.get(), "vertex", keepBlock, &blocks), 70000);
    EXPECT_EQ(ply_set_block_cb(ply.get(), "face", keepBlock, &blocks), 0);
    EXPECT_EQ(ply_set_read_cb(ply.get(), "vertex", "x", recordCall, &outcome, 0), 70000);
    ply_set_read_cb(ply.get(), "edge", "vertex2", recordCall, &outcome, 201);
    ASSERT_TRUE(ply_read(ply.get()));
    const std::size_t start = file.find("end_header\n") + 11;
    EXPECT_TRUE(blocks.bytes == file.substr(start, 70000 * 15));
    EXPECT_TRUE(blocks.contiguous);
    EXPECT_GT(blocks.calls, 1);
    // Only the edge's callback: the vertices went to the blocks.
    EXPECT_EQ(outcome.calls, (std::vector<Call>{{201, 0, 1, 0, 2147483647}}));

    Blocks stopped;
    stopped.stopAt = 2;
    Outcome stoppedOutcome;
    PlyHandle again(ply_open(path.c_str(), recordError, 0, &stoppedOutcome));
    ASSERT_TRUE(ply_read_header(again.get()));
    ply_set_block_cb(again.get(), "vertex", keepBlock, &stopped);
    EXPECT_FALSE(ply_read(again.get()));
    EXPECT_EQ(stopped.calls, 2);
    ASSERT_EQ(stoppedOutcome.errors.size(), 1u);
    EXPECT_NE(stoppedOutcome.errors[0].find("stopped by the block callback of element 'vertex'"),
              std::string::npos);
  }
  PlyHandle ascii(ply_open(plyFile(plyText(scene, "ascii")).c_str(), nullptr, 0, nullptr));
  ASSERT_TRUE(ply_read_header(ascii.get()));
  Blocks none;
  EXPECT_EQ(ply_set_block_cb(ascii.get(), "vertex", keepBlock, &none), 0);
}

TEST(PlyReader, ReportsBrokenFilesThroughTheErrorCallback) {
  const std::string vertexX = "element vertex 2\nproperty float x\nend_header\n";
  const std::string faces = "element face 1\nproperty list uchar int v\nend_header\n";
  struct Case {
    const char* what;
    std::string bytes;
    const char* message;
  } cases[] = {
      {"an empty file", "", "not a PLY file"},
      {"bad magic", "plx\nformat ascii 1.0\n" + vertexX, "not a PLY file"},
      {"no end_header", "ply\nformat ascii 1.0\nelement vertex 1\n", "without \"end_header\""},
      {"no format", "ply\n" + vertexX, "no format"},
      {"unknown format", "ply\nformat binary_middle_endian 1.0\n" + vertexX, "unknown format"},
      {"unknown version", "ply\nformat ascii 2.0\n" + vertexX, "version"},
      {"unknown type", "ply\nformat ascii 1.0\nelement v 1\nproperty flaot x\nend_header\n1\n",
       "unknown property type"},
      {"a float list length",
       "ply\nformat ascii 1.0\nelement f 1\nproperty list float int v\nend_header\n0\n",
       "non-integer length"},
      {"property first", "ply\nformat ascii 1.0\nproperty float x\n" + vertexX,
       "before any element"},
      {"unknown keyword", "ply\nformat ascii 1.0\nelemnt vertex 1\nend_header\n", "not understood"},
      {"negative count", "ply\nformat ascii 1.0\nelement vertex -1\nend_header\n", "bad instance"},
      {"huge count", "ply\nformat ascii 1.0\nelement v 99999999999999999999\nend_header\n",
       "bad instance"},
      {"hostile binary count",
       "ply\nformat binary_little_endian 1.0\nelement vertex 2147483648\nproperty float x\n"
       "end_header\n" +
           std::string(100, '\0'),
       "more than the"},
      {"hostile ascii count",
       "ply\nformat ascii 1.0\nelement vertex 9223372036854775807\nproperty float x\n"
       "property list int int v\nend_header\n" +
           std::string(100, '1'),
       "more than the"},
      {"truncated ascii data", "ply\nformat ascii 1.0\n" + vertexX + "1", "more than the"},
      {"cut ascii data", "ply\nformat ascii 1.0\n" + vertexX + "1.5", "ends inside"},
      {"truncated binary data", "ply\nformat binary_little_endian 1.0\n" + vertexX + "abcde",
       "more than the"},
      {"a binary list past the end",
       "ply\nformat binary_big_endian 1.0\n" + faces + "\xC8" + std::string(12, '\0'),
       "ends inside"},
      {"an ASCII list past the end", "ply\nformat ascii 1.0\n" + faces + "200 1 2 3\n",
       "ends inside"},
      {"a negative list length",
       "ply\nformat binary_little_endian 1.0\nelement f 1\nproperty list char int v\n"
       "end_header\n\xFF",
       "negative list length"},
      {"a bad ASCII value", "ply\nformat ascii 1.0\n" + vertexX + "1.5 abc\n", "bad value"},
      {"a fraction for an int", "ply\nformat ascii 1.0\n" + faces + "1.5 1\n", "bad value"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    const auto path = plyFile(c.bytes);
    const Outcome outcome = readFile(path);
    EXPECT_FALSE(outcome.ok);
    ASSERT_EQ(outcome.errors.size(), 1u);
    EXPECT_EQ(outcome.errors[0].rfind(path.string() + ": ", 0), 0u) << outcome.errors[0];
    EXPECT_NE(outcome.errors[0].find(c.message), std::string::npos) << outcome.errors[0];
  }
}

TEST(PlyReader, ReportsOnStandardErrorWithoutAnErrorCallback) {
  ::testing::internal::CaptureStderr();
  EXPECT_EQ(ply_open("/nonexistent/cloudreel.ply", nullptr, 0, nullptr), nullptr);
  EXPECT_EQ(::testing::internal::GetCapturedStderr(),
            "RPly: /nonexistent/cloudreel.ply: cannot open the file: No such file or directory\n");
}

}  // namespace
}  // namespace cloudreel
