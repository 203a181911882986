#pragma once
// The PLY reader's own state behind the handles of ply.h, shared by the
// files that implement it: ply.cpp (the handle functions and the input
// buffer), ply_header.cpp (the header), ply_binary.cpp and ply_ascii.cpp
// (the data in either encoding). Nothing outside src/import/ply includes it.

#include <cstddef>
#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "import/ply/ply.h"

namespace cloudreel {

namespace ply_detail {

// The encodings behind the sixteen scalar type names.
enum class Scalar : std::uint8_t { I8, U8, I16, U16, I32, U32, F32, F64 };

struct TypeInfo {
  const char* name;
  Scalar scalar;
  std::uint8_t size;
};

// Indexed by e_ply_type.
inline constexpr TypeInfo kTypes[] = {
    {"int8", Scalar::I8, 1},     {"uint8", Scalar::U8, 1},    {"int16", Scalar::I16, 2},
    {"uint16", Scalar::U16, 2},  {"int32", Scalar::I32, 4},   {"uint32", Scalar::U32, 4},
    {"float32", Scalar::F32, 4}, {"float64", Scalar::F64, 8}, {"char", Scalar::I8, 1},
    {"uchar", Scalar::U8, 1},    {"short", Scalar::I16, 2},   {"ushort", Scalar::U16, 2},
    {"int", Scalar::I32, 4},     {"uint", Scalar::U32, 4},    {"float", Scalar::F32, 4},
    {"double", Scalar::F64, 8},
};
inline constexpr int kScalarTypeCount = sizeof(kTypes) / sizeof(kTypes[0]);

// The input is read in blocks of this size; the buffer only grows beyond it
// for a binary instance larger than a block.
inline constexpr std::size_t kBlockSize = std::size_t{1} << 18;
// Longer header lines and ASCII values are refused rather than buffered, so
// a file of garbage without line ends cannot make the buffer grow.
inline constexpr std::size_t kMaxHeaderLine = kBlockSize / 2;
inline constexpr std::size_t kMaxAsciiValue = 4096;

inline constexpr std::uint64_t kSaturated = std::numeric_limits<std::uint64_t>::max();

inline bool isSpace(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

inline bool isInteger(Scalar s) { return s != Scalar::F32 && s != Scalar::F64; }

inline std::uint64_t saturatingMul(std::uint64_t a, std::uint64_t b) {
  std::uint64_t r = 0;
  return __builtin_mul_overflow(a, b, &r) ? kSaturated : r;
}

inline std::uint64_t saturatingAdd(std::uint64_t a, std::uint64_t b) {
  std::uint64_t r = 0;
  return __builtin_add_overflow(a, b, &r) ? kSaturated : r;
}

// A piece of the file for an error message: at most 40 characters, with
// anything unprintable shown as '?'.
std::string quoted(std::string_view text);

}  // namespace ply_detail

struct PlyProperty {
  std::string name;
  e_ply_type type = PLY_LIST;
  e_ply_type lengthType = PLY_UCHAR;
  e_ply_type valueType = PLY_UCHAR;
  PlyElement* element = nullptr;
  std::size_t index = 0;
  p_ply_read_cb readCb = nullptr;
  void* pdata = nullptr;
  long idata = 0;

  bool isList() const { return type == PLY_LIST; }
};

struct PlyElement {
  std::string name;
  long ninstances = 0;
  std::vector<std::unique_ptr<PlyProperty>> properties;
  PlyReader* reader = nullptr;
  std::size_t index = 0;
  // When set, the element's instances go to this callback a block at a time
  // instead of value by value to the properties' callbacks.
  p_ply_block_cb blockCb = nullptr;
  void* blockPdata = nullptr;

  // The bytes of one binary instance; lists count their length only.
  std::size_t fixedSize() const;
  bool hasList() const;
};

struct PlyReader {
  PlyReader(std::string fileName, p_ply_error_cb cb, long userIdata, void* userPdata);
  ~PlyReader();
  PlyReader(const PlyReader&) = delete;
  PlyReader& operator=(const PlyReader&) = delete;

  // Reports the first failure only: later ones are its consequences.
  bool fail(const std::string& message);

  // --- Input (ply.cpp) ------------------------------------------------------
  bool openFile();
  void openMemory(const void* data, std::size_t bytes);
  std::size_t available() const { return static_cast<std::size_t>(end - pos); }
  // Makes at least n bytes available at pos unless the input ends (or
  // reading fails, which is reported) first.
  bool fill(std::size_t n);
  // Passes over n bytes; answers NO when the input ends first.
  bool skip(std::uint64_t n);

  // --- Header (ply_header.cpp) ----------------------------------------------
  bool readLine(std::string_view& line);
  bool readHeader();
  bool parseFormat(std::string_view format, std::string_view version);
  bool parseElement(std::string_view elementName, std::string_view countText);
  bool parseProperty(const std::string_view* words, std::size_t count);
  bool checkDataSize();

  // --- Binary data (ply_binary.cpp) -----------------------------------------
  bool truncated(const PlyElement& element, const PlyProperty* property, long index);
  bool aborted(const PlyArgument& argument);
  bool readData();
  template <bool kSwap>
  bool readFixed(PlyElement& element, std::size_t instanceSize);
  template <bool kSwap>
  bool readBinary(PlyElement& element);
  bool readBlocks(PlyElement& element, std::size_t instanceSize);

  // --- ASCII data (ply_ascii.cpp) -------------------------------------------
  enum class Token { Ok, End, Bad, Failed };
  bool moreAscii();
  Token asciiValue(ply_detail::Scalar scalar, double& real, long long& integer);
  bool skipAsciiValue();
  bool asciiFailure(Token token, e_ply_type type, const PlyElement& element,
                    const PlyProperty& property, long index);
  bool readAscii(PlyElement& element);

  std::string name;
  p_ply_error_cb errorCb;
  long idata;
  void* pdata;

  enum class State { Opened, HeaderRead, Read } state = State::Opened;
  bool failed = false;
  e_ply_storage_mode mode = PLY_ASCII;
  bool formatSeen = false;
  long lineNumber = 1;
  std::vector<std::unique_ptr<PlyElement>> elements;
  std::string comments;
  std::string objInfos;
  std::string badValue;

  // The input: a file read block by block into storage, or memory of the
  // caller's. [pos, end) is what is buffered and not yet consumed.
  int fd = -1;
  std::unique_ptr<char[]> storage;
  std::size_t capacity = 0;
  const char* pos = nullptr;
  const char* end = nullptr;
  bool eof = false;
  // Bytes taken from the input so far, and its size when known.
  std::uint64_t delivered = 0;
  bool sizeKnown = false;
  std::uint64_t size = 0;
};

}  // namespace cloudreel
