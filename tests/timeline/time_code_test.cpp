// Time codes: the fields, the hour wrap, the frame width and the values
// that must not trap.
#include "timeline/time_code.h"

#include <gtest/gtest.h>

#include <climits>

namespace cloudreel {
namespace {

TEST(TimeCode, SplitsFramesIntoHoursMinutesSecondsAndFrames) {
  const struct {
    int frame;
    int fps;
    const char* expected;
  } cases[] = {
      {0, 25, "00:00:00:00"},
      {90061, 25, "01:00:02:11"},
      {12345, 100, "00:02:03:045"},  // three-digit frames from 100 fps
      {98 * 3600 * 25 + 24, 25, "98:00:00:24"},
      {99 * 3600 * 25, 25, "00:00:00:00"},  // hours wrap at 99
      {100 * 3600 * 30 + 5, 30, "01:00:00:05"},
      {INT_MAX, 25, "01:55:45:22"},
      {-26, 25, "00:00:-1:-1"},      // toward zero, as C divides
      {INT_MIN, -1, "48:14:08:00"},  // 2^31 seconds, no overflow
      {1234, 0, "00:00:00:00"},      // no frame rate reads as frame 0
  };
  for (const auto& c : cases) {
    EXPECT_EQ(TimeCode::timeCodeForFrame(c.frame, c.fps), c.expected)
        << c.frame << " at " << c.fps << " fps";
  }
}

}  // namespace
}  // namespace cloudreel
