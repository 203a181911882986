#pragma once
// The core logger. Messages keep the printf-style formats of the design
// ("deallocing point layer", "windowcontrollerdidloadNib:%s"); they go to a
// sink, standard error unless a front end or a test attaches another.

#include <fmt/printf.h>

#include <functional>
#include <string>
#include <string_view>
#include <vector>

namespace cloudreel {

using LogSink = std::function<void(std::string_view message)>;

// Replaces the process-wide sink and answers the previous one. An empty sink
// restores standard error.
LogSink setLogSink(LogSink sink);

// Hands one finished message to the current sink.
void logMessage(std::string_view message);

template <typename... Args>
void logf(std::string_view format, const Args&... args) {
  if constexpr (sizeof...(Args) == 0) {
    logMessage(format);
  } else {
    logMessage(fmt::sprintf(format, args...));
  }
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
