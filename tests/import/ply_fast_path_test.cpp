#include <gtest/gtest.h>

#include <algorithm>
#include <bit>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <limits>
#include <random>
#include <string>
#include <vector>

#include "import/ply/ply.h"
#include "import/ply_file.h"
#include "import/ply_vertex_blocks.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

// A binary PLY file built byte by byte, so that any bit pattern (a
// signalling NaN, a negative zero) reaches the file as it is.
struct Properties {
  std::string header;
  std::size_t size = 0;
  void add(const std::string& type, const std::string& name, std::size_t bytes) {
    header += "property " + type + " " + name + "\n";
    size += bytes;
  }
};

template <typename T>
void put(std::string& out, T value) {
  char bytes[sizeof value];
  std::memcpy(bytes, &value, sizeof value);
  out.append(bytes, sizeof value);
}

// Coordinates with the values that tell conversions apart among ordinary
// ones: zeros of both signs, infinities, quiet and signalling NaNs,
// subnormals, and for doubles values beyond a float's range.
template <typename T>
T coordinate(std::mt19937& random) {
  using Bits = std::conditional_t<sizeof(T) == 4, std::uint32_t, std::uint64_t>;
  const T inf = std::numeric_limits<T>::infinity();
  const T special[] = {T(0.0),
                       T(-0.0),
                       inf,
                       -inf,
                       std::numeric_limits<T>::quiet_NaN(),
                       std::bit_cast<T>(Bits{sizeof(T) == 4 ? 0x7f800001u : 0x7ff0000000000001u}),
                       std::numeric_limits<T>::denorm_min(),
                       sizeof(T) == 8 ? T(1e300) : T(3e38),
                       sizeof(T) == 8 ? T(-1e-300) : T(-1e-40)};
  if (random() % 50 == 0) {
    return special[random() % std::size(special)];
  }
  return T(std::uniform_real_distribution<double>(-1000.0, 1000.0)(random));
}

struct Layout {
  std::string what;
  bool doubles = false;
  bool normals = false;
  bool extrasAfter = false;
  bool facesBefore = false;
  bool facesAfter = false;
};

// A vertex element of x y z, maybe normals, red green blue, maybe extra
// properties after them, maybe with a face element (of lists) before or
// after it.
std::string vertexFile(const Layout& layout, long vertices, unsigned seed) {
  std::mt19937 random(seed);
  Properties p;
  const std::string coordinateType = layout.doubles ? "double" : "float";
  const std::size_t coordinateSize = layout.doubles ? 8 : 4;
  for (const char* axis : {"x", "y", "z"}) p.add(coordinateType, axis, coordinateSize);
  if (layout.normals)
    for (const char* axis : {"nx", "ny", "nz"}) p.add("float", axis, 4);
  for (const char* c : {"red", "green", "blue"}) p.add("uchar", c, 1);
  if (layout.extrasAfter) {
    p.add("uchar", "alpha", 1);
    p.add("double", "quality", 8);
    p.add("int", "label", 4);
  }
  const long faces = 5;
  const std::string faceHeader =
      "element face " + std::to_string(faces) + "\nproperty list uchar int vertex_indices\n";
  std::string out = "ply\nformat binary_little_endian 1.0\ncomment generated\n";
  out += layout.facesBefore ? faceHeader : "";
  out += "element vertex " + std::to_string(vertices) + "\n" + p.header;
  out += layout.facesAfter ? faceHeader : "";
  out += "end_header\n";
  auto putFaces = [&] {
    for (long f = 0; f < faces; ++f) {
      put(out, std::uint8_t{3});
      for (int k = 0; k < 3; ++k) put(out, std::int32_t(f + k));
    }
  };
  if (layout.facesBefore) putFaces();
  for (long i = 0; i < vertices; ++i) {
    for (int axis = 0; axis < 3; ++axis) {
      if (layout.doubles) {
        put(out, coordinate<double>(random));
      } else {
        put(out, coordinate<float>(random));
      }
    }
    if (layout.normals)
      for (int axis = 0; axis < 3; ++axis) put(out, float(random() % 3) - 1.0f);
    for (int c = 0; c < 3; ++c) put(out, std::uint8_t(random()));
    if (layout.extrasAfter) {
      put(out, std::uint8_t(random()));
      put(out, double(random()));
      put(out, std::int32_t(random()));
    }
  }
  if (layout.facesAfter) putFaces();
  return out;
}

std::filesystem::path writeFile(const std::filesystem::path& path, const std::string& bytes) {
  std::ofstream(path, std::ios::binary | std::ios::trunc)
      .write(bytes.data(), std::streamsize(bytes.size()));
  return path;
}

bool readsInBlocks(const std::filesystem::path& path) {
  PlyHandle ply(ply_open(path.c_str(), nullptr, 0, nullptr));
  return ply && ply_read_header(ply.get()) && plyVertexBlockLayout(ply.get()).has_value();
}

// An import, and everything about it a user or the document can see. The
// box is kept as bytes, so NaN compares equal to NaN.
struct Imported {
  bool made = false;
  std::string printed;
  std::int32_t nPoints = 0;
  std::vector<std::uint8_t> records;
  std::vector<std::uint8_t> bbox;
  bool normals = false;
  bool trueColor = false;
  friend bool operator==(const Imported&, const Imported&) = default;
};

std::vector<std::uint8_t> boxBytes(const Layer::BoundingBox& box) {
  std::vector<std::uint8_t> bytes(sizeof box);
  std::memcpy(bytes.data(), box.data(), sizeof box);
  return bytes;
}

Imported import(const std::filesystem::path& path, std::int32_t factor,
                PLYFile::VertexReading reading) {
  Imported result;
  ::testing::internal::CaptureStderr();
  const auto layer = PLYFile::initWithURLDownsample(path, factor, reading);
  result.printed = ::testing::internal::GetCapturedStderr();
  if (!layer) return result;
  result.made = true;
  result.nPoints = layer->nPoints();
  if (layer->pointArray())
    result.records.assign(layer->points(), layer->points() + layer->pointArray()->size());
  result.bbox = boxBytes(layer->bbox());
  result.normals = layer->hasNormalsField();
  result.trueColor = layer->hasTrueColor();
  return result;
}

// What the reader printed, without the layer's own log lines.
std::string readerLines(const std::string& printed) {
  std::string lines;
  for (std::size_t start = 0, end; start < printed.size(); start = end + 1) {
    end = std::min(printed.find('\n', start), printed.size());
    if (printed.compare(start, 6, "RPly: ") == 0) lines += printed.substr(start, end - start + 1);
  }
  return lines;
}

// Both ways in agree on everything, and the measuring pass on the count and
// the box.
void expectSameImport(const std::filesystem::path& path, std::int32_t factor) {
  SCOPED_TRACE("factor " + std::to_string(factor));
  const Imported blocks = import(path, factor, PLYFile::VertexReading::Automatic);
  const Imported callbacks = import(path, factor, PLYFile::VertexReading::Callbacks);
  EXPECT_TRUE(blocks == callbacks) << blocks.printed << " / " << callbacks.printed;
  ::testing::internal::CaptureStderr();
  const auto extent = PLYFile::measureURLDownsample(path, factor);
  const std::string printed = ::testing::internal::GetCapturedStderr();
  if (!readsInBlocks(path)) {
    EXPECT_FALSE(extent);
    return;
  }
  EXPECT_EQ(extent.has_value(), callbacks.made);
  EXPECT_EQ(printed, readerLines(callbacks.printed));
  if (extent && callbacks.made) {
    EXPECT_EQ(extent->nPoints, callbacks.nPoints);
    EXPECT_EQ(boxBytes(extent->bbox), callbacks.bbox);
  }
}

TEST(PLYFileBlocks, DecodesTheCommonLayoutsAsTheCallbacksDo) {
  const testing::TempDir dir;
  const Layout layouts[] = {
      {"float xyz rgb", false, false, false, false, false},
      {"double xyz rgb", true, false, false, false, false},
      {"float with normals", false, true, false, false, false},
      {"double with normals and extras", true, true, true, false, false},
      {"float with extras, faces after", false, false, true, false, true},
      {"double, faces before", true, false, false, true, false},
  };
  // Empty, one, a few, and enough to cross the reader's blocks unevenly.
  for (const Layout& layout : layouts) {
    for (long vertices : {0L, 1L, 7L, 70001L}) {
      SCOPED_TRACE(layout.what + ", " + std::to_string(vertices) + " vertices");
      const auto path =
          writeFile(dir / "v.ply", vertexFile(layout, vertices, unsigned(vertices) + 3));
      ASSERT_TRUE(readsInBlocks(path));
      for (std::int32_t factor : {1, 3, 1000}) expectSameImport(path, factor);
    }
  }
}

// Layouts whose records the callbacks fill in ways a straight decoding
// would not (colour before a coordinate, both colour namings, no colour) or
// whose values need converting (big-endian, ASCII, other types), next to
// ones it may take (a repeated name, the diffuse names, colour first among
// other properties): the blocks take only what they can reproduce.
TEST(PLYFileBlocks, LeavesOtherLayoutsToTheCallbacksWithTheSameResult) {
  const testing::TempDir dir;
  const std::string xyz = "property float x\nproperty float y\nproperty float z\n";
  const std::string rgb = "property uchar red\nproperty uchar green\nproperty uchar blue\n";
  struct Case {
    const char* what;
    std::string format;
    std::string properties;
    bool blocks;
  } cases[] = {
      {"plain", "binary_little_endian", xyz + rgb, true},
      {"diffuse names", "binary_little_endian",
       xyz + "property uchar diffuse_red\nproperty uchar diffuse_green\nproperty uchar "
             "diffuse_blue\n",
       true},
      {"colour between extras", "binary_little_endian",
       "property short a\n" + xyz + "property int b\n" + rgb + "property float c\n", true},
      {"a repeated x", "binary_little_endian", xyz + "property double x\n" + rgb, true},
      {"blue first", "binary_little_endian",
       "property uchar blue\n" + xyz + "property uchar red\nproperty uchar green\n", false},
      {"red after blue", "binary_little_endian",
       xyz + "property uchar green\nproperty uchar blue\nproperty uchar red\n", false},
      {"both namings", "binary_little_endian",
       xyz + rgb +
           "property uchar diffuse_red\nproperty uchar diffuse_green\nproperty uchar "
           "diffuse_blue\n",
       false},
      {"no colour", "binary_little_endian", xyz, false},
      {"mixed coordinates", "binary_little_endian",
       "property float x\nproperty double y\nproperty float z\n" + rgb, false},
      {"int coordinates", "binary_little_endian",
       "property int x\nproperty int y\nproperty int z\n" + rgb, false},
      {"float colour", "binary_little_endian",
       xyz + "property float red\nproperty float green\nproperty float blue\n", false},
      {"a list", "binary_little_endian", xyz + rgb + "property list uchar int l\n", false},
      {"big-endian", "binary_big_endian", xyz + rgb, false},
      {"ascii", "ascii", xyz + rgb, false},
  };
  std::mt19937 random(11);
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    const std::string header = "ply\nformat " + c.format + " 1.0\nelement vertex 300\n" +
                               c.properties + "element vertex 2\n" + xyz + "end_header\n";
    std::string body;
    if (c.format == "ascii") {
      for (int i = 0; i < 302; ++i) {
        for (std::size_t k = 0; k < 7; ++k) body += std::to_string(random() % 200) + " ";
        body += "\n";
      }
    } else {
      // Every value's bytes are small integers or floats near them, so any
      // type reads them as something sensible, with a list length of 1.
      for (std::size_t k = 0; k < 302 * 64; ++k) body.push_back(char(random() % 2));
    }
    const auto path = writeFile(dir / "odd.ply", header + body);
    EXPECT_EQ(readsInBlocks(path), c.blocks);
    for (std::int32_t factor : {1, 4}) expectSameImport(path, factor);
  }
}

// A header checks list lengths only, so data can run out inside the vertex
// records after a face element's lists, or inside a later element: both
// ways fail with the reader's same message, and measuring fails with it.
TEST(PLYFileBlocks, FailsOnTruncatedFilesAsTheCallbacksDo) {
  const testing::TempDir dir;
  for (bool before : {true, false}) {
    const Layout layout{"", false, true, true, before, !before};
    const std::string whole = vertexFile(layout, 20000, 5);
    for (std::size_t cut : {1, 13, 40, 65, 333, 20000 * 20, 20000 * 20 + 7}) {
      SCOPED_TRACE(std::string(before ? "faces before" : "faces after") + ", cut " +
                   std::to_string(cut));
      const auto path = writeFile(dir / "cut.ply", whole.substr(0, whole.size() - cut));
      const Imported blocks = import(path, 1, PLYFile::VertexReading::Automatic);
      const Imported callbacks = import(path, 1, PLYFile::VertexReading::Callbacks);
      EXPECT_FALSE(callbacks.made);
      EXPECT_NE(callbacks.printed.find("RPly: "), std::string::npos) << callbacks.printed;
      EXPECT_TRUE(blocks == callbacks) << blocks.printed << " / " << callbacks.printed;
      expectSameImport(path, 1);
    }
  }
}

// The point files kept for the fuzzer came from elsewhere.
TEST(PLYFileBlocks, ReadsTheKeptSampleFilesAsTheCallbacksDo) {
  const std::filesystem::path corpus =
      std::filesystem::path(CLOUDREEL_SOURCE_DIR) / "fuzz" / "corpus" / "ply";
  int files = 0;
  for (const auto& entry : std::filesystem::directory_iterator(corpus)) {
    SCOPED_TRACE(entry.path().filename().string());
    ++files;
    for (std::int32_t factor : {1, 2}) expectSameImport(entry.path(), factor);
  }
  EXPECT_GE(files, 4);
  EXPECT_TRUE(readsInBlocks(corpus / "points_little.ply"));
}

}  // namespace
}  // namespace cloudreel
