#pragma once
// Reads a text file the way the reconstruction formats are meant to be read
// with fgets and scanf, but from a stream and with every read bounded: line
// reads take at most 511 characters (a 512-byte line buffer), and numbers
// are whitespace-separated fields. A line can also be skipped whole,
// however long.
//
// Unlike scanf, a field is always consumed whole: its leading number is the
// value ("12.5abc" reads as 12.5 for a float, 12 for an integer) and a field
// with no leading number reads as 0. So a damaged file can never stall the
// reading, and every value read is defined.

#include <cstddef>
#include <cstdint>
#include <vector>

namespace cloudreel {

class InputStream;

class TextScanner {
 public:
  // Reads `in` from its current position; the stream must outlive the
  // scanner.
  explicit TextScanner(InputStream& in);

  // Consumes up to and including the next newline, but never more than 511
  // characters (the rest of a longer line is left for the next read).
  // Answers NO when nothing was left to read.
  bool readLine();
  // Consumes up to and including the next newline, however far it is (or
  // to the end of the text). Answers NO when nothing was left to read.
  bool skipLine();

  // The next field as a number. At the end of the text the target is left
  // as it is and the answer is NO; a field without a leading number stores
  // 0 and answers NO. A number beyond the type's range stores the nearest
  // end of the range for integers and 0 for floating point.
  bool scan(std::int64_t& value);
  bool scan(float& value);
  bool scan(double& value);

  // The rules the scans above read a field by, for readers that hold the
  // text in memory and must read it as the scanner would: white space is
  // the C locale's, a field's first kFieldLimit characters are its number.
  static constexpr std::size_t kFieldLimit = 511;
  static constexpr bool isSpace(char c) {
    return c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' || c == '\r';
  }
  // The value of the field of `length` characters at `field` (at most
  // kFieldLimit of them are looked at) and the answer, as scan gives them.
  static bool parseField(const char* field, std::size_t length, std::int64_t& value);
  static bool parseField(const char* field, std::size_t length, float& value);
  static bool parseField(const char* field, std::size_t length, double& value);

  // Skips white space and answers whether any text remains.
  bool atEnd();
  // Bytes not yet consumed.
  std::uint64_t remainingBytes() const;

 private:
  bool fill();
  // The next field, its first 511 characters in fieldData_; false at end.
  bool nextField();

  InputStream& in_;
  std::vector<char> buffer_;
  std::size_t next_ = 0;
  std::size_t end_ = 0;
  // The field read last: in the buffer where it lies whole there, else
  // gathered into field_.
  const char* fieldData_ = nullptr;
  char field_[kFieldLimit + 1] = {};
  std::size_t fieldLength_ = 0;
};

}  // namespace cloudreel
