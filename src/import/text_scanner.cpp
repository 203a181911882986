#include "import/text_scanner.h"

#include <charconv>
#include <limits>
#include <system_error>

#include "platform/byte_stream.h"

namespace cloudreel {

namespace {

constexpr std::size_t kChunk = std::size_t{64} << 10;
// A line read stops after this many characters, as fgets into 512 bytes does.
constexpr std::size_t kLineLimit = 511;

// The C locale's white space, whatever locale the application runs in.
bool isSpace(int c) {
  return c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' || c == '\r';
}

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

int TextScanner::peek() { return fill() ? static_cast<unsigned char>(buffer_[next_]) : -1; }

std::uint64_t TextScanner::remainingBytes() const { return (end_ - next_) + in_.remaining(); }

bool TextScanner::readLine() {
  std::size_t taken = 0;
  while (taken < kLineLimit && fill()) {
    const char c = buffer_[next_++];
    ++taken;
    if (c == '\n') {
      break;
    }
  }
  return taken > 0;
}

bool TextScanner::atEnd() {
  for (int c = peek(); c >= 0 && isSpace(c); c = peek()) {
    ++next_;
  }
  return peek() < 0;
}

bool TextScanner::nextField() {
  if (atEnd()) {
    return false;
  }
  fieldLength_ = 0;
  for (int c = peek(); c >= 0 && !isSpace(c); c = peek()) {
    if (fieldLength_ < sizeof(field_) - 1) {
      field_[fieldLength_++] = static_cast<char>(c);
    }
    ++next_;
  }
  return true;
}

bool TextScanner::scan(std::int64_t& value) {
  if (!nextField()) {
    return false;
  }
  const char* last = field_ + fieldLength_;
  const char* first = numberStart(field_, last);
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
  const char* last = field + length;
  F parsed = 0;
  const auto [ptr, ec] = std::from_chars(numberStart(field, last), last, parsed);
  value = ec == std::errc() ? parsed : F{0};
  return ec == std::errc();
}

}  // namespace

bool TextScanner::scan(float& value) {
  return nextField() && parseFloating(field_, fieldLength_, value);
}

bool TextScanner::scan(double& value) {
  return nextField() && parseFloating(field_, fieldLength_, value);
}

}  // namespace cloudreel
