#include "import/ply_file.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <string>
#include <tuple>
#include <vector>

#include "scene/archive_helpers.h"
#include "support/ply_text.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

struct Element {
  std::string name;
  std::vector<std::string> properties;  // "type name": float, double or uchar
  std::vector<std::vector<double>> rows;
};

std::filesystem::path writePly(const std::filesystem::path& path, const std::string& format,
                               const std::vector<Element>& elements) {
  std::vector<testing::PlyElement> ply;
  for (const Element& e : elements) {
    ply.push_back({e.name, {}, e.rows});
    for (const std::string& p : e.properties) {
      ply.back().properties.push_back({p.substr(0, p.find(' ')), p.substr(p.find(' ') + 1)});
    }
  }
  return testing::writeFile(path, testing::plyText(ply, format));
}

using Record = std::tuple<float, float, float, int, int, int, int>;  // x y z r g b luck

std::vector<Record> recordsOf(const PointLayer& layer) {
  std::vector<Record> records;
  for (const color_point& p : layer.colorPoints())
    records.emplace_back(p.x, p.y, p.z, p.r, p.g, p.b, p.luck);
  return records;
}

const std::vector<std::string> kXyz = {"double x", "float y", "float z"};
std::vector<std::string> xyzAnd(const std::string& r, const std::string& g, const std::string& b) {
  auto properties = kXyz;
  properties.insert(properties.end(), {r, g, b});
  return properties;
}
const std::vector<std::string> kXyzRgb = xyzAnd("uchar red", "uchar green", "uchar blue");

TEST(PLYFile, ReadsTheSameCloudFromEveryFormatAndColourNaming) {
  const testing::TempDir dir;
  for (std::string format : {"ascii", "binary_little_endian", "binary_big_endian"}) {
    for (std::string d : {"", "diffuse_"}) {
      SCOPED_TRACE(format + " " + d);
      const auto properties =
          xyzAnd("uchar " + d + "red", "uchar " + d + "green", "uchar " + d + "blue");
      const auto layer = PLYFile::initWithURLDownsample(
          writePly(dir / "cloud.ply", format,
                   {{"face", {"uchar n"}, {{3}}},
                    {"vertex",
                     properties,
                     {{1.5, -2, 3, 10, 20, 30}, {-4, 5.25, -6, 255, 0, 1}, {0.5, 0, 9, 7, 8, 9}}}}),
          1);
      ASSERT_TRUE(layer);
      EXPECT_EQ(layer->name(), "cloud.ply");
      EXPECT_EQ(layer->nPoints(), 3);
      EXPECT_EQ(recordsOf(*layer), (std::vector<Record>{{1.5f, -2, 3, 10, 20, 30, 0},
                                                        {-4, 5.25f, -6, 255, 0, 1, 1},
                                                        {0.5f, 0, 9, 7, 8, 9, 2}}));
      EXPECT_EQ(layer->bbox(), (Layer::BoundingBox{-4, -2, -6, 1.5, 5.25, 9}));
    }
  }
}

// Vertex k becomes record k / factor when k is a multiple of the factor and
// the array, of count / factor records, has room for it.
TEST(PLYFile, KeepsEveryFactorthVertexWithinTheArray) {
  const testing::TempDir dir;
  std::vector<std::vector<double>> rows;
  for (int k = 0; k < 10; ++k) rows.push_back({double(k), -double(k), 1, double(k), 0, 0});
  const auto path = writePly(dir / "ten.ply", "binary_little_endian", {{"vertex", kXyzRgb, rows}});
  // factor, the step between kept vertices, the records
  for (auto [factor, step, count] :
       {std::tuple{1, 1, 10}, {0, 1, 10}, {-3, 1, 10}, {3, 3, 3}, {11, 11, 0}}) {
    SCOPED_TRACE(factor);
    const auto layer = PLYFile::initWithURLDownsample(path, factor);
    ASSERT_TRUE(layer);
    std::vector<Record> expected;
    for (int r = 0; r < count; ++r)
      expected.emplace_back(r * step, -r * step, 1, r * step, 0, 0, r);
    EXPECT_EQ(recordsOf(*layer), expected);
    const double last = count > 0 ? (count - 1) * step : 0, z = count > 0 ? 1 : 0;
    EXPECT_EQ(layer->bbox(), (Layer::BoundingBox{0, -last, z, last, 0, z}));
  }
}

// A blue value completes a vertex: a file with both namings completes each
// twice. Values with no record left are dropped, never written past the
// array. A colour keeps the low byte of its value truncated to 64 bits, or 0
// when it has none; a coordinate past a float's range is infinite.
TEST(PLYFile, FillsRecordsSafelyFromOddLayoutsAndValues) {
  const testing::TempDir dir;
  auto both = xyzAnd("uchar diffuse_red", "uchar diffuse_green", "uchar diffuse_blue");
  both.insert(both.end(), kXyzRgb.begin() + 3, kXyzRgb.end());
  const double inf = std::numeric_limits<float>::infinity(), nan = std::nan("");
  const struct {
    std::vector<Element> elements;
    std::vector<Record> records;
  } cases[] = {
      {{{"vertex", both, {{1, 2, 3, 4, 5, 6, 7, 8, 9}, {10, 11, 12, 13, 14, 15, 16, 17, 18}}}},
       {{1, 2, 3, 4, 5, 6, 0}, {0, 0, 0, 7, 8, 9, 1}}},
      // The callbacks are bound to the first "vertex" element, which has no
      // x: the count is 0 and its blue values find no record.
      {{{"vertex", {"uchar blue"}, {{1}, {2}}}, {"vertex", kXyz, {{1, 2, 3}}}}, {}},
      {{{"vertex",
         xyzAnd("double red", "double green", "double blue"),
         {{1e300, 0, 0, 256, 255.9, -1}, {0, 0, 0, nan, 1e300, -inf}}}},
       {{inf, 0, 0, 0, 255, 255, 0}, {0, 0, 0, 0, 0, 0, 1}}}};
  for (const auto& c : cases) {
    const auto layer =
        PLYFile::initWithURLDownsample(writePly(dir / "v.ply", "binary_big_endian", c.elements), 1);
    ASSERT_TRUE(layer);
    EXPECT_EQ(recordsOf(*layer), c.records);
  }
}

// Without a blue value the last coordinate completes a vertex, whatever
// the order of the coordinates, and every point is white: red and green
// alone are not read.
TEST(PLYFile, AFileWithoutColourGivesOneWhitePointAVertex) {
  const testing::TempDir dir;
  constexpr int w = 255;
  const struct {
    std::vector<std::string> properties;
    std::vector<std::vector<double>> rows;
    int factor;
    std::vector<Record> records;
  } cases[] = {
      {kXyz,
       {{1, 2, 3}, {4, 5, 6}, {7, 8, 9}},
       1,
       {{1, 2, 3, w, w, w, 0}, {4, 5, 6, w, w, w, 1}, {7, 8, 9, w, w, w, 2}}},
      {{"float z", "uchar red", "float x", "float y", "uchar green"},
       {{3, 10, 1, 2, 20}, {6, 10, 4, 5, 20}},
       1,
       {{1, 2, 3, w, w, w, 0}, {4, 5, 6, w, w, w, 1}}},
      {{"float x", "float y", "uchar intensity"},
       {{1, 2, 50}, {4, 5, 50}},
       1,
       {{1, 2, 0, w, w, w, 0}, {4, 5, 0, w, w, w, 1}}},
      {kXyz,
       {{1, 2, 3}, {4, 5, 6}, {7, 8, 9}, {0, 0, 0}, {0, 0, 0}},
       2,
       {{1, 2, 3, w, w, w, 0}, {7, 8, 9, w, w, w, 1}}},
  };
  for (const std::string format : {"ascii", "binary_little_endian"}) {
    for (const auto& c : cases) {
      SCOPED_TRACE(format + ", first " + c.properties.front() + ", factor " +
                   std::to_string(c.factor));
      const auto layer = PLYFile::initWithURLDownsample(
          writePly(dir / "plain.ply", format, {{"vertex", c.properties, c.rows}}), c.factor);
      ASSERT_TRUE(layer);
      EXPECT_EQ(recordsOf(*layer), c.records);
    }
  }
}

TEST(PLYFile, AnswersNullWhenTheFileCannotBeRead) {
  const testing::TempDir dir;
  const std::string header =
      "ply\nformat ascii 1.0\nelement vertex 3\nproperty float x\nend_header\n";
  // More records than an int32 numbers (2^32 + 1, which a narrowing would
  // wrap to 1) are refused before anything is read; the sparse body of
  // zeros makes the header's count believable.
  const std::string huge =
      "ply\nformat binary_little_endian 1.0\nelement vertex 4294967297\nproperty uchar "
      "x\nend_header\n";
  for (const std::string& text :
       {std::string("garbage\n"), header + "1 234\n", header + "1 2 x\n", huge}) {
    testing::writeFile(dir / "bad.ply", text);
    if (text == huge) std::filesystem::resize_file(dir / "bad.ply", huge.size() + 4294967297u);
    EXPECT_FALSE(PLYFile::initWithURLDownsample(dir / "bad.ply", 1)) << text;
  }
  EXPECT_FALSE(PLYFile::initWithURLDownsample(dir / "missing.ply", 1));
}

TEST(PLYFile, IsATrueColourLayerThatArchivesAndCopiesButNeverSaves) {
  const testing::TempDir dir;
  const auto layer = PLYFile::initWithURLDownsample(
      writePly(dir / "p.ply", "ascii", {{"vertex", kXyzRgb, {{1, 2, 3, 4, 5, 6}}}}), 1);
  ASSERT_TRUE(layer);
  EXPECT_TRUE(layer->hasTrueColor());
  Error error;
  EXPECT_FALSE(layer->savePointsToURLError(dir / "out.rwb", &error));
  layer->saveLinkedLayer();
  EXPECT_FALSE(std::filesystem::exists(dir / "out.rwb"));
  const auto decoded = testing::roundTrip(layer);
  ASSERT_TRUE(decoded);
  EXPECT_EQ(recordsOf(*decoded), recordsOf(*layer));
  const auto copy = std::dynamic_pointer_cast<PLYFile>(layer->copy());
  ASSERT_TRUE(copy);
  EXPECT_EQ(copy->pointArray(), layer->pointArray());
}

}  // namespace
}  // namespace cloudreel
