#include "platform/log.h"

#include <atomic>
#include <cstdio>
#include <mutex>

namespace cloudreel {
namespace {

// Off-screen frames are written on a background thread, which may log, so the
// sink is guarded.
std::mutex& sinkMutex() {
  static std::mutex mutex;
  return mutex;
}

LogSink& currentSink() {
  static LogSink sink;
  return sink;
}

std::atomic<LogLevel>& threshold() {
  static std::atomic<LogLevel> level{LogLevel::Debug};
  return level;
}

}  // namespace

void setLogThreshold(LogLevel level) { threshold() = level; }
LogLevel logThreshold() { return threshold(); }

LogSink setLogSink(LogSink sink) {
  std::lock_guard lock(sinkMutex());
  LogSink previous = std::move(currentSink());
  currentSink() = std::move(sink);
  return previous;
}

void logMessage(std::string_view message, LogLevel level) {
  std::lock_guard lock(sinkMutex());
  if (currentSink()) {
    currentSink()(message);
    return;
  }
  if (level < threshold()) {
    return;
  }
  std::fwrite(message.data(), 1, message.size(), stderr);
  if (message.empty() || message.back() != '\n') {
    std::fputc('\n', stderr);
  }
}

CapturedLog::CapturedLog() {
  previous_ = setLogSink([this](std::string_view message) { lines_.emplace_back(message); });
}

CapturedLog::~CapturedLog() { setLogSink(std::move(previous_)); }

int CapturedLog::count(std::string_view text) const {
  int n = 0;
  for (const std::string& line : lines_) {
    if (line.find(text) != std::string::npos) {
      ++n;
    }
  }
  return n;
}

}  // namespace cloudreel
