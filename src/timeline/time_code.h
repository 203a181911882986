#pragma once
// Frame numbers as the time code the timeline shows: hours, minutes,
// seconds and frames, "hh:mm:ss:ff".

#include <string>

namespace cloudreel {

class TimeCode {
 public:
  // With integer division and remainder: s = frame / fps, ff = frame % fps,
  // hh = (s / 3600) % 99, mm = (s / 60) % 60, ss = s % 60, each at least two
  // digits; the frame field takes three when fps is 100 or more. Hours wrap
  // at 99, not 24: 99 hours reads 00. Negative frames divide as C does
  // (toward zero), so their fields print with a minus sign. An fps of 0 has
  // no time code and reads as frame 0, "00:00:00:00".
  static std::string timeCodeForFrame(int frame, int fps);
};

}  // namespace cloudreel
