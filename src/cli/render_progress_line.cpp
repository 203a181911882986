#include "cli/render_progress_line.h"

#include <fmt/format.h>
#include <unistd.h>

#include <cmath>
#include <cstdio>

#include "cli/json_output.h"

namespace cloudreel::cli {
namespace {

std::string duration(double seconds) {
  const auto whole = static_cast<long long>(std::llround(std::max(seconds, 0.0)));
  if (whole >= 3600) {
    return fmt::format("{}:{:02}:{:02}", whole / 3600, whole / 60 % 60, whole % 60);
  }
  return fmt::format("{}:{:02}", whole / 60, whole % 60);
}

}  // namespace

RenderProgressLine::Style RenderProgressLine::styleNamed(std::string_view name) {
  if (name == "json") {
    return Style::Json;
  }
  if (name == "plain") {
    return Style::Plain;
  }
  return isatty(STDERR_FILENO) == 1 ? Style::Live : Style::Plain;
}

RenderProgressLine::RenderProgressLine(Style style, int frameCount)
    : style_(style), frameCount_(frameCount), start_(Clock::now()) {}

double RenderProgressLine::framesPerSecond() const {
  const double elapsed = std::chrono::duration<double>(Clock::now() - start_).count();
  return drawn_ > 0 && elapsed > 0 ? drawn_ / elapsed : 0.0;
}

double RenderProgressLine::secondsLeft() const {
  const double rate = framesPerSecond();
  return rate > 0 ? (frameCount_ - done_) / rate : 0.0;
}

void RenderProgressLine::start(const std::filesystem::path& folder) {
  folder_ = folder;
  start_ = Clock::now();
  if (style_ != Style::Json) {
    std::fprintf(stderr, "Rendering %d frame%s into %s\n", frameCount_, frameCount_ == 1 ? "" : "s",
                 folder.c_str());
  }
}

void RenderProgressLine::frameDone(int frame, bool written, const std::string& failure,
                                   const std::vector<std::filesystem::path>& files) {
  ++drawn_;
  report(frame, written, false, failure, files);
}

void RenderProgressLine::frameSkipped(int frame) { report(frame, true, true, {}, {}); }

void RenderProgressLine::report(int frame, bool written, bool skipped, const std::string& failure,
                                const std::vector<std::filesystem::path>& files) {
  ++done_;
  lastFrame_ = frame;
  if (!written) {
    if (lineOpen_) {
      std::fputc('\n', stderr);
      lineOpen_ = false;
    }
    std::fprintf(stderr, "cloudreel render: frame %d was not written: %s\n", frame,
                 failure.c_str());
  }
  const double rate = framesPerSecond();
  switch (style_) {
    case Style::Json: {
      nlohmann::ordered_json object{{"frame", frame},   {"done", done_},
                                    {"total", frameCount_}, {"written", written},
                                    {"skipped", skipped}, {"framesPerSecond", rate},
                                    {"secondsLeft", secondsLeft()}};
      nlohmann::ordered_json names = nlohmann::ordered_json::array();
      for (const auto& file : files) {
        names.push_back(file.string());
      }
      object["files"] = std::move(names);
      if (!written) {
        object["error"] = failure;
      }
      std::fputs(jsonText(object).c_str(), stdout);
      std::fflush(stdout);
      break;
    }
    case Style::Plain:
      std::fprintf(stderr, "frame %d of %d (frame %d%s), %.2f fps, %s left\n", done_, frameCount_,
                   frame, skipped ? ", already there" : "", rate, duration(secondsLeft()).c_str());
      break;
    case Style::Live:
      std::fprintf(stderr, "\rframe %d of %d  %.2f fps  %s left   ", done_, frameCount_, rate,
                   duration(secondsLeft()).c_str());
      std::fflush(stderr);
      lineOpen_ = true;
      break;
  }
}

void RenderProgressLine::finish(bool interrupted, int unwritten) {
  if (lineOpen_) {
    std::fputc('\n', stderr);
  }
  const double elapsed = std::chrono::duration<double>(Clock::now() - start_).count();
  if (interrupted) {
    std::fprintf(stderr, "Stopped by Ctrl-C after frame %d: %d of %d frames done\n", lastFrame_,
                 done_, frameCount_);
  } else {
    std::fprintf(stderr, "Rendered %d frame%s into %s in %s (%.2f fps)\n", drawn_,
                 drawn_ == 1 ? "" : "s", folder_.c_str(), duration(elapsed).c_str(),
                 framesPerSecond());
  }
  if (unwritten > 0) {
    std::fprintf(stderr, "cloudreel render: %d frame%s could not be written\n", unwritten,
                 unwritten == 1 ? "" : "s");
  }
}

}  // namespace cloudreel::cli
