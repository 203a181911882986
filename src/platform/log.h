#pragma once
// The core logger. Messages keep the printf-style formats of the design
// ("deallocing point layer", "windowcontrollerdidloadNib:%s"); they go to a
// sink, standard error unless a front end or a test attaches another.
//
// Each message has a level. The free-text diagnostics (logf) are debug
// lines; warnings and errors (logWarningf, logErrorf) are what a user must
// see. Standard error shows the levels from the threshold up: everything
// unless a front end quietens it (the command line shows debug lines only
// with --verbose). An attached sink receives every message, so tests see
// the diagnostics whatever the threshold.

#include <fmt/printf.h>

#include <functional>
#include <string>
#include <string_view>
#include <vector>

namespace cloudreel {

using LogSink = std::function<void(std::string_view message)>;

enum class LogLevel { Debug, Warning, Error };

// The lowest level standard error shows; Debug (all) until changed.
void setLogThreshold(LogLevel level);
LogLevel logThreshold();

// Replaces the process-wide sink and answers the previous one. An empty sink
// restores standard error.
LogSink setLogSink(LogSink sink);

// Hands one finished message to the current sink.
void logMessage(std::string_view message, LogLevel level = LogLevel::Debug);

template <typename... Args>
void logAt(LogLevel level, std::string_view format, const Args&... args) {
  if constexpr (sizeof...(Args) == 0) {
    logMessage(format, level);
  } else {
    logMessage(fmt::sprintf(format, args...), level);
  }
}

// A diagnostic: what the program is doing, for whoever looks into it.
template <typename... Args>
void logf(std::string_view format, const Args&... args) {
  logAt(LogLevel::Debug, format, args...);
}
// Something went wrong that the user should know of, though work goes on.
template <typename... Args>
void logWarningf(std::string_view format, const Args&... args) {
  logAt(LogLevel::Warning, format, args...);
}
template <typename... Args>
void logErrorf(std::string_view format, const Args&... args) {
  logAt(LogLevel::Error, format, args...);
}

// Collects every message logged during its lifetime instead of printing it,
// then puts the previous sink back. Meant for tests.
class CapturedLog {
 public:
  CapturedLog();
  ~CapturedLog();
  CapturedLog(const CapturedLog&) = delete;
  CapturedLog& operator=(const CapturedLog&) = delete;

  const std::vector<std::string>& lines() const { return lines_; }
  // How many captured lines contain the given text.
  int count(std::string_view text) const;

 private:
  std::vector<std::string> lines_;
  LogSink previous_;
};

}  // namespace cloudreel
