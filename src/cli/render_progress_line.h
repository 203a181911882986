#pragma once
// How `cloudreel render` shows its progress: a line that rewrites itself on
// a terminal (frame n of m, frames per second, time left), one plain line a
// frame when standard error is a file or a pipe, or one JSON object a frame
// on standard output for schedulers. Failures to write a frame are always
// named on standard error.

#include <chrono>
#include <filesystem>
#include <string>
#include <string_view>
#include <vector>

namespace cloudreel::cli {

class RenderProgressLine {
 public:
  enum class Style { Live, Plain, Json };
  // "auto" is Live on a terminal and Plain otherwise; "plain"; "json".
  static Style styleNamed(std::string_view name);

  RenderProgressLine(Style style, int frameCount);

  void start(const std::filesystem::path& folder);
  void frameDone(int frame, bool written, const std::string& failure,
                 const std::vector<std::filesystem::path>& files);
  void frameSkipped(int frame);
  void finish(bool interrupted, int unwritten);

 private:
  using Clock = std::chrono::steady_clock;
  // Frames drawn per second so far, and the seconds the rest will take at
  // that rate; 0 until a frame was drawn.
  double framesPerSecond() const;
  double secondsLeft() const;
  void report(int frame, bool written, bool skipped, const std::string& failure,
              const std::vector<std::filesystem::path>& files);

  Style style_;
  int frameCount_;
  int done_ = 0;
  int drawn_ = 0;
  int lastFrame_ = -1;
  std::filesystem::path folder_;
  Clock::time_point start_;
  bool lineOpen_ = false;
};

}  // namespace cloudreel::cli
