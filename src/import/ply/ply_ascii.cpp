// The ASCII encoding of PLY data: whitespace-separated values, parsed by
// the type their property declares.

#include <charconv>
#include <cmath>
#include <limits>
#include <string>
#include <system_error>

#include "import/ply/ply_reader.h"

namespace cloudreel {

using namespace ply_detail;

// Reads more input while keeping the value that starts at pos.
bool PlyReader::moreAscii() {
  if (available() >= kMaxAsciiValue) {
    return fail("an ASCII value is longer than " + std::to_string(kMaxAsciiValue) + " characters");
  }
  fill(available() + 1);
  return !failed;
}

// The next whitespace-separated value, parsed as the scalar type says:
// integers exactly (into `integer` too), float32 as a float, float64 as a
// double.
PlyReader::Token PlyReader::asciiValue(Scalar scalar, double& real, long long& integer) {
  for (;;) {
    while (pos < end && isSpace(*pos)) {
      ++pos;
    }
    if (pos == end) {
      if (eof) {
        return Token::End;
      }
      if (!moreAscii()) {
        return Token::Failed;
      }
      continue;
    }
    const char* first = pos;
    if (*first == '+' && end - first > 1 && first[1] != '-') {
      ++first;
    }
    std::from_chars_result result{};
    if (scalar == Scalar::F32) {
      float value = 0.0f;
      result = std::from_chars(first, end, value);
      real = value;
      if (result.ec == std::errc::result_out_of_range) {
        // Beyond a float's range (a tiny value, or a huge one): rounded
        // from its double to zero or infinity as a float reader would.
        result = std::from_chars(first, end, real);
        real = std::abs(real) > std::numeric_limits<float>::max()
                   ? std::copysign(std::numeric_limits<double>::infinity(), real)
                   : static_cast<double>(static_cast<float>(real));
      }
    } else if (scalar == Scalar::F64) {
      result = std::from_chars(first, end, real);
    } else {
      integer = 0;
      result = std::from_chars(first, end, integer);
      real = static_cast<double>(integer);
    }
    bool cut = !eof && result.ptr == end;
    if (!cut && result.ec == std::errc() && (result.ptr == end || isSpace(*result.ptr))) {
      pos = result.ptr;
      return Token::Ok;
    }
    const char* last = pos;
    while (last < end && !isSpace(*last)) {
      ++last;
    }
    if (last == end && !eof) {
      // The value may go on in the next block.
      if (!moreAscii()) {
        return Token::Failed;
      }
      continue;
    }
    badValue.assign(pos, last);
    pos = last;
    return Token::Bad;
  }
}

bool PlyReader::skipAsciiValue() {
  for (;;) {
    while (pos < end && isSpace(*pos)) {
      ++pos;
    }
    if (pos < end) {
      break;
    }
    if (eof || !moreAscii()) {
      return false;
    }
  }
  for (;;) {
    while (pos < end && !isSpace(*pos)) {
      ++pos;
    }
    if (pos < end || eof) {
      return true;
    }
    if (!moreAscii()) {
      return false;
    }
  }
}

bool PlyReader::asciiFailure(Token token, e_ply_type type, const PlyElement& element,
                             const PlyProperty& property, long index) {
  if (token == Token::Bad) {
    return fail("bad value " + quoted(badValue) + " for " + kTypes[type].name + " in element " +
                quoted(element.name) + ", property " + quoted(property.name) + " (instance " +
                std::to_string(index) + ")");
  }
  return truncated(element, &property, index);
}

bool PlyReader::readAscii(PlyElement& element) {
  PlyArgument argument;
  argument.element_ = &element;
  double real = 0.0;
  long long integer = 0;
  for (long index = 0; index < element.ninstances; ++index) {
    argument.instanceIndex_ = index;
    for (const auto& owned : element.properties) {
      PlyProperty& property = *owned;
      if (!property.isList() && !property.readCb) {
        if (!skipAsciiValue()) {
          return truncated(element, &property, index);
        }
        continue;
      }
      e_ply_type first = property.isList() ? property.lengthType : property.type;
      Token token = asciiValue(kTypes[first].scalar, real, integer);
      if (token != Token::Ok) {
        return asciiFailure(token, first, element, property, index);
      }
      argument.property_ = &property;
      argument.pdata_ = property.pdata;
      argument.idata_ = property.idata;
      if (!property.isList()) {
        argument.length_ = 1;
        argument.valueIndex_ = 0;
        argument.value_ = real;
        if (!property.readCb(&argument)) {
          return aborted(argument);
        }
        continue;
      }
      if (integer < 0) {
        return fail("negative list length in element " + quoted(element.name) + ", property " +
                    quoted(property.name) + " (instance " + std::to_string(index) + ")");
      }
      long length = static_cast<long>(integer);
      if (!property.readCb) {
        for (long i = 0; i < length; ++i) {
          if (!skipAsciiValue()) {
            return truncated(element, &property, index);
          }
        }
        continue;
      }
      argument.length_ = length;
      argument.valueIndex_ = -1;
      argument.value_ = real;
      if (!property.readCb(&argument)) {
        return aborted(argument);
      }
      Scalar item = kTypes[property.valueType].scalar;
      for (long i = 0; i < length; ++i) {
        token = asciiValue(item, real, integer);
        if (token != Token::Ok) {
          return asciiFailure(token, property.valueType, element, property, index);
        }
        argument.valueIndex_ = i;
        argument.value_ = real;
        if (!property.readCb(&argument)) {
          return aborted(argument);
        }
      }
    }
  }
  return true;
}
}  // namespace cloudreel
