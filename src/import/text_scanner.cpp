#include "import/text_scanner.h"

#include <algorithm>
#include <charconv>
#include <cstring>
#include <limits>
#include <system_error>

#include "platform/byte_stream.h"

namespace cloudreel {

namespace {

constexpr std::size_t kChunk = std::size_t{64} << 10;
// A line read stops after this many characters, as fgets into 512 bytes does.
constexpr std::size_t kLineLimit = 511;

// The field without a leading '+', which from_chars does not take.
const char* numberStart(const char* first, const char* last) {
  return first != last && *first == '+' ? first + 1 : first;
}

}  // namespace

TextScanner::TextScanner(InputStream& in) : in_(in), buffer_(kChunk) {}

bool TextScanner::fill() {
  if (next_ < end_) {
    return true;
  }
  const std::uint64_t left = in_.remaining();
  const std::size_t n = left < kChunk ? static_cast<std::size_t>(left) : kChunk;
  next_ = 0;
  end_ = 0;
  if (n == 0 || !in_.read(buffer_.data(), n)) {
    return false;
  }
  end_ = n;
  return true;
}

std::uint64_t TextScanner::remainingBytes() const { return (end_ - next_) + in_.remaining(); }

// The scans below take the buffered bytes a run at a time and refill only
// when a run is used up; a refill test on every byte was most of the cost
// of a large import.

bool TextScanner::readLine() {
  std::size_t taken = 0;
  while (taken < kLineLimit && fill()) {
    const char* run = buffer_.data() + next_;
    const std::size_t length = std::min(end_ - next_, kLineLimit - taken);
    const void* newline = std::memchr(run, '\n', length);
    const std::size_t used =
        newline ? static_cast<std::size_t>(static_cast<const char*>(newline) - run) + 1 : length;
    next_ += used;
    taken += used;
    if (newline) {
      break;
    }
  }
  return taken > 0;
}

bool TextScanner::skipLine() {
  bool taken = false;
  while (fill()) {
    const char* run = buffer_.data() + next_;
    const auto* newline = static_cast<const char*>(std::memchr(run, '\n', end_ - next_));
    taken = true;
    if (newline != nullptr) {
      next_ += static_cast<std::size_t>(newline - run) + 1;
      return true;
    }
    next_ = end_;
  }
  return taken;
}

bool TextScanner::atEnd() {
  while (fill()) {
    while (next_ < end_ && isSpace(buffer_[next_])) {
      ++next_;
    }
    if (next_ < end_) {
      return false;
    }
  }
  return true;
}

bool TextScanner::nextField() {
  if (atEnd()) {
    return false;
  }
  // A field may run over the end of the buffer; its first 511 characters
  // are kept, the rest consumed.
  fieldLength_ = 0;
  fieldData_ = field_;
  while (fill()) {
    const char* run = buffer_.data() + next_;
    std::size_t length = 0;
    while (next_ + length < end_ && !isSpace(run[length])) {
      ++length;
    }
    if (fieldLength_ == 0 && next_ + length < end_) {
      // Whole in the buffer: parsed where it lies, which stays valid until
      // the next fill.
      fieldData_ = run;
      fieldLength_ = std::min(length, kFieldLimit);
      next_ += length;
      break;
    }
    const std::size_t kept = std::min(length, kFieldLimit - fieldLength_);
    std::memcpy(field_ + fieldLength_, run, kept);
    fieldLength_ += kept;
    next_ += length;
    if (next_ < end_) {
      break;
    }
  }
  return true;
}

bool TextScanner::parseField(const char* field, std::size_t length, std::int64_t& value) {
  const char* last = field + std::min(length, kFieldLimit);
  const char* first = numberStart(field, last);
  std::int64_t parsed = 0;
  const auto [ptr, ec] = std::from_chars(first, last, parsed);
  if (ec == std::errc::result_out_of_range) {
    value = *first == '-' ? std::numeric_limits<std::int64_t>::min()
                          : std::numeric_limits<std::int64_t>::max();
    return true;
  }
  value = ec == std::errc() ? parsed : 0;
  return ec == std::errc();
}

namespace {

template <typename F>
bool parseFloating(const char* field, std::size_t length, F& value) {
  const char* last = field + std::min(length, TextScanner::kFieldLimit);
  F parsed = 0;
  const auto [ptr, ec] = std::from_chars(numberStart(field, last), last, parsed);
  value = ec == std::errc() ? parsed : F{0};
  return ec == std::errc();
}

}  // namespace

bool TextScanner::parseField(const char* field, std::size_t length, float& value) {
  return parseFloating(field, length, value);
}

bool TextScanner::parseField(const char* field, std::size_t length, double& value) {
  return parseFloating(field, length, value);
}

bool TextScanner::scan(std::int64_t& value) {
  return nextField() && parseField(fieldData_, fieldLength_, value);
}

bool TextScanner::scan(float& value) {
  return nextField() && parseField(fieldData_, fieldLength_, value);
}

bool TextScanner::scan(double& value) {
  return nextField() && parseField(fieldData_, fieldLength_, value);
}

}  // namespace cloudreel
