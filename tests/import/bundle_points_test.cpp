#include "import/bundle_points.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <random>
#include <span>
#include <string>
#include <vector>

#include "platform/byte_stream.h"

namespace cloudreel {
namespace {

// What reading a points section leaves: the records (all of the array, so
// that stray writes past the count show), the count, the box and where the
// stream stands (unchecked: only the one-thread reading leaves it at the
// end).
struct Reading {
  std::vector<std::uint8_t> records;
  std::int32_t count = 0;
  bool hasBox = false;
  Layer::BoundingBox box{};
};

// The section follows a header line, as in a bundle file, so the reading
// starts in the middle of the stream.
Reading readSection(const std::string& section, std::int32_t capacity, std::size_t stride,
                    const BundlePointReading& how) {
  const std::string text = "3 2\n" + section;
  MemoryInputStream in(std::span(reinterpret_cast<const std::uint8_t*>(text.data()), text.size()));
  EXPECT_TRUE(in.seek(4));
  Reading r;
  r.records.assign(static_cast<std::size_t>(capacity) * stride, 0);
  const BundlePoints points = readBundlePoints(in, r.records.data(), stride, capacity, how);
  r.count = points.count;
  r.hasBox = points.box.has_value();
  r.box = points.box.value_or(Layer::BoundingBox{});
  return r;
}

// Equal to the bit, so that a NaN or a -0 in the box must be the same one.
void expectSameReading(const Reading& parallel, const Reading& reference) {
  EXPECT_EQ(parallel.count, reference.count);
  EXPECT_EQ(parallel.hasBox, reference.hasBox);
  EXPECT_EQ(std::memcmp(parallel.box.data(), reference.box.data(), sizeof parallel.box), 0)
      << "box x " << parallel.box[0] << ".." << parallel.box[3] << " against " << reference.box[0]
      << ".." << reference.box[3];
  ASSERT_EQ(parallel.records.size(), reference.records.size());
  for (std::size_t i = 0; i < parallel.records.size(); ++i) {
    if (parallel.records[i] != reference.records[i]) {
      ADD_FAILURE() << "the records differ at byte " << i;
      return;
    }
  }
}

// The parallel readings to hold against the one-thread one: tiny blocks
// put points across block ends and parts within a few characters of each
// other; a block of two characters cuts every field. (A reading is left
// out where it would take over a thousand blocks: each costs two wake-ups
// of its threads, and shorter sections show the same.)
const BundlePointReading kParallel[] = {
    {2, 2}, {2, 3}, {3, 7}, {2, 16}, {4, 29}, {2, 64}, {3, 200}, {2, 4096}, {4, 1 << 16},
};

// Reads `section` with each parallel reading, and with capacities below,
// at and above its points, and expects the one-thread reading each time.
void expectEveryReadingAlike(const std::string& section, std::int32_t points) {
  for (const std::int32_t capacity : {1, points / 2, points, points + 3}) {
    if (capacity <= 0) continue;
    for (const std::size_t stride : {std::size_t{16}, std::size_t{28}}) {
      const Reading reference = readSection(section, capacity, stride, {1, 1 << 16});
      for (const BundlePointReading& how : kParallel) {
        if (section.size() / how.blockBytes > 1000) continue;
        SCOPED_TRACE(testing::Message() << "capacity " << capacity << ", stride " << stride << ", "
                                        << how.threads << " threads, block " << how.blockBytes);
        expectSameReading(readSection(section, capacity, stride, how), reference);
        if (::testing::Test::HasFailure()) return;
      }
    }
  }
}

// Numbers written in the ways reconstructions and people write them.
std::string number(std::mt19937& random, bool integer) {
  const std::uint32_t form = random() % 6;
  const long whole = static_cast<long>(random() % 2000) - 1000;
  if (integer || form == 0) return std::to_string(whole);
  if (form == 1) return std::to_string(whole) + "." + std::to_string(random() % 1000);
  if (form == 2) return std::to_string(whole / 100) + ".5e" + std::to_string(random() % 7);
  if (form == 3) return "+" + std::to_string(random() % 50);
  if (form == 4) return "-0";
  return std::to_string(whole) + ".0000000001234567e-2";
}

std::string wellFormedPoints(std::mt19937& random, int count, const char* newline) {
  std::string text;
  for (int i = 0; i < count; ++i) {
    text += number(random, false) + " " + number(random, false) + " " + number(random, false);
    text += newline;
    text += number(random, true) + " " + number(random, true) + " " + number(random, true);
    text += newline;
    const std::uint32_t views = random() % 4 == 0 ? random() % 60 : random() % 5;
    text += std::to_string(views);
    for (std::uint32_t v = 0; v < views; ++v) {
      text += " " + std::to_string(random() % 500) + " " + std::to_string(random() % 9000) + " " +
              number(random, false) + " " + number(random, false);
    }
    text += newline;
  }
  return text;
}

TEST(BundlePoints, WellFormedSectionsReadInParallelAsOnOneThread) {
  std::mt19937 random(11);
  for (const int count : {1, 2, 3, 5, 17, 100, 400}) {
    for (const char* newline : {"\n", "\r\n"}) {
      SCOPED_TRACE(testing::Message() << count << " points, newline " << int(newline[0]));
      const std::string section = wellFormedPoints(random, count, newline);
      expectEveryReadingAlike(section, count);
      // Without its last line end, and with white space after it.
      expectEveryReadingAlike(section.substr(0, section.size() - 1), count);
      expectEveryReadingAlike(section + " \n\t\n", count);
    }
  }
}

// Sections whose points do not take three lines each, or whose numbers
// are not numbers: every reading reads them as the scanner does, points
// out of step included.
TEST(BundlePoints, DamagedSectionsReadInParallelAsOnOneThread) {
  const std::string nanFirst = "nan 1 2\n1 2 3\n0\n-5 inf -0\n4 5 6\n0\n3 nan 0\n7 8 9\n0\n";
  const std::string longField = std::string(600, '7') + "." + std::string(700, '1') + " " + "1." +
                                std::string(520, '0') + "9 -1e99999\n" + std::string(530, '9') +
                                " -" + std::string(40, '9') + " 300\n0\n";
  const struct {
    const char* name;
    std::string section;
  } cases[] = {
      {"a point on two lines", "1 2\n3\n4 5 6\n0\n7 8 9\n10 11 12\n0\n13 14 15\n16 17 18\n0\n"},
      {"a point on four lines", "1 2 3\n4\n5 6\n0\n7 8 9\n10 11 12\n0\n"},
      {"blank lines between points", "\n\n1 2 3\n4 5 6\n0\n\n\n7 8 9\n10 11 12\n0\n\n"},
      {"no view lists", "1 2 3\n4 5 6\n7 8 9\n10 11 12\n13 14 15\n16 17 18\n"},
      {"other white space", "1\t2\v3\n4\f5\r6\n0\n7 8 9\n10 11 12\n0\n"},
      {"cut in a field", "1 2 3\n4 5 6\n0\n7 8 9\n10 1"},
      {"cut in a view list", "1 2 3\n4 5 6\n3 1 2"},
      {"only white space", " \n \t\n\n  "},
      {"words for numbers", "x y z\nr g b\n\n1.5q 2e 3\n0x10 +-4 ++5\n0\n"},
      {"nan, inf and -0", nanFirst},
      {"fields past 511 characters", longField + longField},
      {"a view list longer than any block",
       "1 2 3\n4 5 6\n" + std::string(70000, '1') + "\n7 8 9\n10 11 12\n0\n"},
      {"a colour line longer than any block",
       "1 2 3\n4 5 6 " + std::string(70000, 'x') + "\n0\n7 8 9\n10 11 12\n0\n"},
      {"white space longer than any block",
       "1 2 3\n4 5 6\n0\n" + std::string(70000, ' ') + "7 8 9\n10 11 12\n0\n"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    expectEveryReadingAlike(c.section, 6);
  }
}

// A good section with characters dropped, doubled and put in at random
// places: line ends, white space, signs and digits, so that points fall
// out of step with the parts' guesses in every way.
TEST(BundlePoints, RandomlyDamagedSectionsReadInParallelAsOnOneThread) {
  std::mt19937 random(5);
  const std::string inserts = "\n\n\n  \t\r-+.e0123456789xn";
  for (int trial = 0; trial < 40; ++trial) {
    std::string section = wellFormedPoints(random, 60, "\n");
    const std::uint32_t damages = 1 + random() % 12;
    for (std::uint32_t d = 0; d < damages; ++d) {
      const std::size_t at = random() % section.size();
      switch (random() % 3) {
        case 0:
          section.erase(at, 1 + random() % 3);
          break;
        case 1:
          section.insert(at, 1, inserts[random() % inserts.size()]);
          break;
        default:
          section.insert(at, section.substr(at, random() % 40));
          break;
      }
    }
    SCOPED_TRACE(testing::Message() << "trial " << trial);
    expectEveryReadingAlike(section, 60);
  }
}

// The box follows the layer's rule point by point: the first point sets
// it, a later value moves it only when strictly beyond it. So a NaN first
// stays, a later NaN is passed over, and of 0 and -0 the first is kept,
// wherever the parts of a parallel reading begin.
TEST(BundlePoints, TheBoxIsThatOfThePointsInFileOrder) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  const struct {
    const char* name;
    std::vector<const char*> xs;
    double low, high;
  } cases[] = {
      {"a NaN first stays", {"nan", "-5", "3", "nan", "7"}, nan, nan},
      {"later NaNs are passed over", {"5", "nan", "1", "nan", "7", "nan"}, 1, 7},
      {"-0 before 0", {"-0", "0", "0", "-0"}, -0.0, -0.0},
      {"0 before -0", {"0", "-0", "-0", "0"}, 0.0, 0.0},
      {"infinities",
       {"1", "-inf", "inf", "2"},
       -std::numeric_limits<double>::infinity(),
       std::numeric_limits<double>::infinity()},
  };
  for (const auto& c : cases) {
    std::string section;
    for (const char* x : c.xs) section += std::string(x) + " 0 0\n1 2 3\n0\n";
    // Blocks of two to six points, so that parts begin at every point.
    std::vector<BundlePointReading> readings = {{1}};
    for (const unsigned threads : {2u, 3u, 4u}) {
      for (const std::size_t block : {40u, 48u, 64u, 80u, 100u})
        readings.push_back({threads, block});
    }
    for (const BundlePointReading& how : readings) {
      SCOPED_TRACE(testing::Message() << c.name << ", " << how.threads << " threads");
      const Reading r = readSection(section, 10, 16, how);
      ASSERT_TRUE(r.hasBox);
      const double low = r.box[0], high = r.box[3];
      EXPECT_EQ(std::isnan(low), std::isnan(c.low));
      EXPECT_EQ(std::isnan(high), std::isnan(c.high));
      if (!std::isnan(c.low)) {
        EXPECT_EQ(low, c.low);
        EXPECT_EQ(high, c.high);
        EXPECT_EQ(std::signbit(low), std::signbit(c.low));
        EXPECT_EQ(std::signbit(high), std::signbit(c.high));
      }
    }
  }
}

TEST(BundlePoints, StoresColourBitsLuckAndTheBoxOfThePoints) {
  std::string section;
  for (int i = 0; i < 300; ++i) {
    section += std::to_string(i % 7) + " " + std::to_string(-i) + " 0.5\n300 -1 " +
               std::to_string(i) + "\n1 0 12 3.5 -1\n";
  }
  for (const BundlePointReading& how : {BundlePointReading{1}, BundlePointReading{2, 64}}) {
    const Reading r = readSection(section, 300, 16, how);
    ASSERT_EQ(r.count, 300);
    const std::uint8_t* last = r.records.data() + 299 * 16;
    float y = 0;
    std::memcpy(&y, last + 4, sizeof y);
    EXPECT_EQ(y, -299.0f);
    // Low eight bits: 300 is 44, -1 is 255, 299 is 43; luck is the index
    // modulo 256.
    EXPECT_EQ(std::vector<int>(last + 12, last + 16), (std::vector<int>{44, 255, 43, 43}));
    EXPECT_EQ(r.box, (Layer::BoundingBox{0, -299, 0.5, 6, 0, 0.5}));
  }
}

}  // namespace
}  // namespace cloudreel
