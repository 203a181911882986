#include "import/ply/ply.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <bit>
#include <cerrno>
#include <charconv>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <limits>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

namespace cloudreel {

namespace {

// The encodings behind the sixteen scalar type names.
enum class Scalar : std::uint8_t { I8, U8, I16, U16, I32, U32, F32, F64 };

struct TypeInfo {
  const char* name;
  Scalar scalar;
  std::uint8_t size;
};

// Indexed by e_ply_type.
constexpr TypeInfo kTypes[] = {
    {"int8", Scalar::I8, 1},     {"uint8", Scalar::U8, 1},    {"int16", Scalar::I16, 2},
    {"uint16", Scalar::U16, 2},  {"int32", Scalar::I32, 4},   {"uint32", Scalar::U32, 4},
    {"float32", Scalar::F32, 4}, {"float64", Scalar::F64, 8}, {"char", Scalar::I8, 1},
    {"uchar", Scalar::U8, 1},    {"short", Scalar::I16, 2},   {"ushort", Scalar::U16, 2},
    {"int", Scalar::I32, 4},     {"uint", Scalar::U32, 4},    {"float", Scalar::F32, 4},
    {"double", Scalar::F64, 8},
};
constexpr int kScalarTypeCount = sizeof(kTypes) / sizeof(kTypes[0]);

// The input is read in blocks of this size; the buffer only grows beyond it
// for a binary instance larger than a block.
constexpr std::size_t kBlockSize = std::size_t{1} << 18;
// Longer header lines and ASCII values are refused rather than buffered, so
// a file of garbage without line ends cannot make the buffer grow.
constexpr std::size_t kMaxHeaderLine = kBlockSize / 2;
constexpr std::size_t kMaxAsciiValue = 4096;

constexpr std::uint64_t kSaturated = std::numeric_limits<std::uint64_t>::max();

bool isSpace(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

bool isInteger(Scalar s) { return s != Scalar::F32 && s != Scalar::F64; }

bool typeFromName(std::string_view name, e_ply_type& type) {
  for (int i = 0; i < kScalarTypeCount; ++i) {
    if (name == kTypes[i].name) {
      type = static_cast<e_ply_type>(i);
      return true;
    }
  }
  return false;
}

std::uint64_t saturatingMul(std::uint64_t a, std::uint64_t b) {
  std::uint64_t r = 0;
  return __builtin_mul_overflow(a, b, &r) ? kSaturated : r;
}

std::uint64_t saturatingAdd(std::uint64_t a, std::uint64_t b) {
  std::uint64_t r = 0;
  return __builtin_add_overflow(a, b, &r) ? kSaturated : r;
}

template <typename U, bool kSwap>
U load(const char* p) {
  U v;
  std::memcpy(&v, p, sizeof v);
  if constexpr (kSwap && sizeof(U) > 1) {
    if constexpr (sizeof(U) == 2) {
      v = __builtin_bswap16(v);
    } else if constexpr (sizeof(U) == 4) {
      v = __builtin_bswap32(v);
    } else {
      v = __builtin_bswap64(v);
    }
  }
  return v;
}

// One binary value; kSwap when the file's byte order is not the machine's.
template <bool kSwap>
inline double decode(const char* p, Scalar s) {
  switch (s) {
    case Scalar::I8:
      return static_cast<std::int8_t>(*p);
    case Scalar::U8:
      return static_cast<unsigned char>(*p);
    case Scalar::I16:
      return static_cast<std::int16_t>(load<std::uint16_t, kSwap>(p));
    case Scalar::U16:
      return load<std::uint16_t, kSwap>(p);
    case Scalar::I32:
      return static_cast<std::int32_t>(load<std::uint32_t, kSwap>(p));
    case Scalar::U32:
      return load<std::uint32_t, kSwap>(p);
    case Scalar::F32:
      return std::bit_cast<float>(load<std::uint32_t, kSwap>(p));
    case Scalar::F64:
      return std::bit_cast<double>(load<std::uint64_t, kSwap>(p));
  }
  return 0.0;
}

// The same property of `count` consecutive instances `size` bytes apart,
// into out[0], out[stride], ...
template <typename T, typename U, bool kSwap>
void decodeRunAs(const char* p, std::size_t size, long count, double* out, std::size_t stride) {
  for (long i = 0; i < count; ++i, p += size, out += stride) {
    *out = std::bit_cast<T>(load<U, kSwap>(p));
  }
}

template <bool kSwap>
void decodeRun(const char* p, std::size_t size, long count, Scalar s, double* out,
               std::size_t stride) {
  switch (s) {
    case Scalar::I8:
      return decodeRunAs<std::int8_t, std::uint8_t, kSwap>(p, size, count, out, stride);
    case Scalar::U8:
      return decodeRunAs<std::uint8_t, std::uint8_t, kSwap>(p, size, count, out, stride);
    case Scalar::I16:
      return decodeRunAs<std::int16_t, std::uint16_t, kSwap>(p, size, count, out, stride);
    case Scalar::U16:
      return decodeRunAs<std::uint16_t, std::uint16_t, kSwap>(p, size, count, out, stride);
    case Scalar::I32:
      return decodeRunAs<std::int32_t, std::uint32_t, kSwap>(p, size, count, out, stride);
    case Scalar::U32:
      return decodeRunAs<std::uint32_t, std::uint32_t, kSwap>(p, size, count, out, stride);
    case Scalar::F32:
      return decodeRunAs<float, std::uint32_t, kSwap>(p, size, count, out, stride);
    case Scalar::F64:
      return decodeRunAs<double, std::uint64_t, kSwap>(p, size, count, out, stride);
  }
}

// A piece of the file for an error message: at most 40 characters, with
// anything unprintable shown as '?'.
std::string quoted(std::string_view text) {
  std::string out = "'";
  for (char c : text.substr(0, 40)) {
    out += (c >= ' ' && c <= '~') ? c : '?';
  }
  out += text.size() > 40 ? "...'" : "'";
  return out;
}

void reportOnStandardError(p_ply, const char* message) {
  std::fprintf(stderr, "RPly: %s\n", message);
}

}  // namespace

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
};

struct PlyReader {
  PlyReader(std::string fileName, p_ply_error_cb cb, long userIdata, void* userPdata)
      : name(std::move(fileName)),
        errorCb(cb ? cb : reportOnStandardError),
        idata(userIdata),
        pdata(userPdata) {}
  ~PlyReader() {
    if (fd >= 0) {
      ::close(fd);
    }
  }
  PlyReader(const PlyReader&) = delete;
  PlyReader& operator=(const PlyReader&) = delete;

  // Reports the first failure only: later ones are its consequences.
  bool fail(const std::string& message) {
    if (!failed) {
      failed = true;
      std::string text = name + ": " + message;
      errorCb(this, text.c_str());
    }
    return false;
  }

  // --- Input ---------------------------------------------------------------

  bool openFile() {
    fd = ::open(name.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
      return fail("cannot open the file: " + std::generic_category().message(errno));
    }
    struct stat info {};
    if (::fstat(fd, &info) == 0 && S_ISREG(info.st_mode)) {
      sizeKnown = true;
      size = static_cast<std::uint64_t>(info.st_size);
      ::posix_fadvise(fd, 0, 0, POSIX_FADV_SEQUENTIAL);
    }
    capacity = kBlockSize;
    storage = std::make_unique_for_overwrite<char[]>(capacity);
    pos = end = storage.get();
    return true;
  }

  void openMemory(const void* data, std::size_t bytes) {
    sizeKnown = true;
    size = bytes;
    delivered = bytes;
    eof = true;
    pos = static_cast<const char*>(data);
    end = pos + bytes;
  }

  std::size_t available() const { return static_cast<std::size_t>(end - pos); }

  // Makes at least n bytes available at pos unless the input ends (or
  // reading fails, which is reported) first.
  bool fill(std::size_t n) {
    std::size_t have = available();
    if (have >= n) {
      return true;
    }
    if (eof || failed) {
      return false;
    }
    if (capacity < n) {
      std::size_t grown = std::max(n, capacity * 2);
      auto bigger = std::make_unique_for_overwrite<char[]>(grown);
      std::memcpy(bigger.get(), pos, have);
      storage = std::move(bigger);
      capacity = grown;
    } else if (have > 0) {
      std::memmove(storage.get(), pos, have);
    }
    pos = storage.get();
    end = pos + have;
    while (have < n) {
      ssize_t got = ::read(fd, storage.get() + have, capacity - have);
      if (got < 0 && errno == EINTR) {
        continue;
      }
      if (got < 0) {
        return fail("reading failed: " + std::generic_category().message(errno));
      }
      if (got == 0) {
        eof = true;
        break;
      }
      have += static_cast<std::size_t>(got);
      delivered += static_cast<std::uint64_t>(got);
      end = pos + have;
    }
    return have >= n;
  }

  // Passes over n bytes; answers NO when the input ends first.
  bool skip(std::uint64_t n) {
    std::size_t have = available();
    if (n <= have) {
      pos += n;
      return true;
    }
    n -= have;
    pos = end;
    if (eof || failed) {
      return false;
    }
    if (sizeKnown) {
      if (n > size - std::min(size, delivered)) {
        return false;
      }
      delivered += n;
      return ::lseek(fd, static_cast<off_t>(delivered), SEEK_SET) >= 0 ||
             fail("seeking failed: " + std::generic_category().message(errno));
    }
    while (n > 0) {
      if (!fill(1)) {
        return false;
      }
      std::size_t step = static_cast<std::size_t>(std::min<std::uint64_t>(n, available()));
      pos += step;
      n -= step;
    }
    return true;
  }

  // --- Header --------------------------------------------------------------

  // The next line without its line end (LF or CR LF).
  bool readLine(std::string_view& line) {
    for (;;) {
      std::size_t have = available();
      const void* newline = std::memchr(pos, '\n', have);
      std::size_t length =
          newline ? static_cast<std::size_t>(static_cast<const char*>(newline) - pos) : have;
      if (newline || (eof && have > 0)) {
        line = std::string_view(pos, length);
        pos += newline ? length + 1 : length;
        if (!line.empty() && line.back() == '\r') {
          line.remove_suffix(1);
        }
        return true;
      }
      if (eof || failed) {
        return fail("the header ends without \"end_header\"");
      }
      if (have >= kMaxHeaderLine) {
        return fail("header line " + std::to_string(lineNumber) + " is too long");
      }
      fill(have + 1);
    }
  }

  bool readHeader() {
    fill(4);
    if (available() < 4 || std::memcmp(pos, "ply", 3) != 0 || (pos[3] != '\n' && pos[3] != '\r')) {
      return fail("not a PLY file (it does not start with \"ply\")");
    }
    std::string_view line;
    readLine(line);
    for (;;) {
      ++lineNumber;
      if (!readLine(line)) {
        return false;
      }
      std::string_view words[6];
      std::size_t count = 0;
      const char* keywordEnd = line.data();
      for (std::size_t i = 0; i < line.size();) {
        while (i < line.size() && isSpace(line[i])) {
          ++i;
        }
        std::size_t start = i;
        while (i < line.size() && !isSpace(line[i])) {
          ++i;
        }
        if (i > start) {
          if (count == 0) {
            keywordEnd = line.data() + i;
          }
          if (count < std::size(words)) {
            words[count] = line.substr(start, i - start);
          }
          ++count;
        }
      }
      if (count == 0) {
        continue;
      }
      std::string_view keyword = words[0];
      bool ok = true;
      if (keyword == "end_header" && count == 1) {
        break;
      } else if (keyword == "comment" || keyword == "obj_info") {
        std::string_view text(keywordEnd,
                              static_cast<std::size_t>(line.data() + line.size() - keywordEnd));
        if (!text.empty()) {
          text.remove_prefix(1);
        }
        std::string& texts = keyword == "comment" ? comments : objInfos;
        std::size_t start = texts.size();
        texts.append(text);
        // The texts are kept one after another, each ending in a NUL.
        std::replace(texts.begin() + static_cast<std::ptrdiff_t>(start), texts.end(), '\0', ' ');
        texts.push_back('\0');
      } else if (keyword == "format" && count == 3) {
        ok = parseFormat(words[1], words[2]);
      } else if (keyword == "element" && count == 3) {
        ok = parseElement(words[1], words[2]);
      } else if (keyword == "property" && (count == 3 || count == 5)) {
        ok = parseProperty(words, count);
      } else {
        ok = fail("header line " + std::to_string(lineNumber) +
                  " is not understood: " + quoted(line));
      }
      if (!ok) {
        return false;
      }
    }
    if (!formatSeen) {
      return fail("the header has no format line");
    }
    return checkDataSize();
  }

  bool parseFormat(std::string_view format, std::string_view version) {
    if (formatSeen || !elements.empty()) {
      return fail("header line " + std::to_string(lineNumber) +
                  ": the format must come once, before the elements");
    }
    if (format == "ascii") {
      mode = PLY_ASCII;
    } else if (format == "binary_little_endian") {
      mode = PLY_LITTLE_ENDIAN;
    } else if (format == "binary_big_endian") {
      mode = PLY_BIG_ENDIAN;
    } else {
      return fail("unknown format " + quoted(format));
    }
    if (version != "1.0") {
      return fail("unsupported format version " + quoted(version));
    }
    formatSeen = true;
    return true;
  }

  bool parseElement(std::string_view elementName, std::string_view countText) {
    long count = -1;
    auto [stop, ec] = std::from_chars(countText.data(), countText.data() + countText.size(), count);
    if (ec != std::errc() || stop != countText.data() + countText.size() || count < 0) {
      return fail("element " + quoted(elementName) + " has a bad instance count " +
                  quoted(countText));
    }
    auto element = std::make_unique<PlyElement>();
    element->name = elementName;
    element->ninstances = count;
    element->reader = this;
    element->index = elements.size();
    elements.push_back(std::move(element));
    return true;
  }

  bool parseProperty(const std::string_view* words, std::size_t count) {
    if (elements.empty()) {
      return fail("header line " + std::to_string(lineNumber) + ": a property before any element");
    }
    auto property = std::make_unique<PlyProperty>();
    bool known = true;
    if (count == 3) {
      known = typeFromName(words[1], property->type);
      property->lengthType = property->valueType = property->type;
      property->name = words[2];
    } else {
      known = words[1] == "list" && typeFromName(words[2], property->lengthType) &&
              typeFromName(words[3], property->valueType);
      property->name = words[4];
      if (known && !isInteger(kTypes[property->lengthType].scalar)) {
        return fail("list " + quoted(property->name) + " has a non-integer length type");
      }
    }
    if (!known) {
      return fail("header line " + std::to_string(lineNumber) + " has an unknown property type");
    }
    PlyElement& element = *elements.back();
    property->element = &element;
    property->index = element.properties.size();
    element.properties.push_back(std::move(property));
    return true;
  }

  // Refuses a header whose elements cannot fit in the bytes that follow it,
  // so nobody sizes storage by a count the file cannot back.
  bool checkDataSize() {
    if (!sizeKnown) {
      return true;
    }
    std::uint64_t offset = delivered - available();
    std::uint64_t dataBytes = size - std::min(size, offset);
    std::uint64_t needed = 0;
    for (const auto& element : elements) {
      std::uint64_t perInstance = 0;
      for (const auto& property : element->properties) {
        e_ply_type counted = property->isList() ? property->lengthType : property->type;
        perInstance += mode == PLY_ASCII ? 2 : kTypes[counted].size;
      }
      needed = saturatingAdd(
          needed, saturatingMul(perInstance, static_cast<std::uint64_t>(element->ninstances)));
      // An ASCII file needs no separator after its last value.
      if ((mode == PLY_ASCII ? needed - std::min<std::uint64_t>(needed, 1) : needed) > dataBytes) {
        return fail("the header declares " + std::to_string(element->ninstances) +
                    " instances of element " + quoted(element->name) + ", more than the " +
                    std::to_string(dataBytes) + " bytes of data can hold");
      }
    }
    return true;
  }

  // --- Data ----------------------------------------------------------------

  bool truncated(const PlyElement& element, const PlyProperty* property, long index) {
    std::string where = "element " + quoted(element.name);
    if (property) {
      where += ", property " + quoted(property->name);
    }
    if (index >= 0) {
      where +=
          " (instance " + std::to_string(index) + " of " + std::to_string(element.ninstances) + ")";
    }
    return fail("the file ends inside " + where);
  }

  bool aborted(const PlyArgument& argument) {
    return fail("reading stopped by the callback of element " + quoted(argument.element_->name) +
                ", property " + quoted(argument.property_->name) + " (instance " +
                std::to_string(argument.instanceIndex_) + ")");
  }

  bool readData() {
    bool swap = (mode == PLY_BIG_ENDIAN) != (std::endian::native == std::endian::big);
    for (const auto& owned : elements) {
      PlyElement& element = *owned;
      if (element.ninstances == 0 || element.properties.empty()) {
        continue;
      }
      bool ok = true;
      if (mode == PLY_ASCII) {
        ok = readAscii(element);
      } else {
        bool hasList = false;
        bool hasCallback = false;
        std::uint64_t instanceSize = 0;
        for (const auto& property : element.properties) {
          hasList |= property->isList();
          hasCallback |= property->readCb != nullptr;
          instanceSize += kTypes[property->isList() ? property->lengthType : property->type].size;
        }
        if (!hasList && !hasCallback) {
          std::uint64_t bytes =
              saturatingMul(instanceSize, static_cast<std::uint64_t>(element.ninstances));
          ok = skip(bytes) || truncated(element, nullptr, -1);
        } else if (!hasList) {
          ok = swap ? readFixed<true>(element, instanceSize)
                    : readFixed<false>(element, instanceSize);
        } else {
          ok = swap ? readBinary<true>(element) : readBinary<false>(element);
        }
      }
      if (!ok) {
        return false;
      }
    }
    return true;
  }

  // Instances of one size, read a run at a time straight from the buffer:
  // each property with a callback is first decoded for the whole run (one
  // type dispatch per run, not per value), then the callbacks are called in
  // file order. Properties without a callback are never touched. Each
  // property keeps its own argument, filled once, so a call costs only the
  // stores of the instance index and the value.
  template <bool kSwap>
  bool readFixed(PlyElement& element, std::size_t instanceSize) {
    struct Step {
      std::size_t offset;
      Scalar scalar;
      p_ply_read_cb readCb;
      PlyArgument argument;
    };
    std::vector<Step> steps;
    std::size_t offset = 0;
    for (const auto& property : element.properties) {
      if (property->readCb) {
        Step& step = steps.emplace_back();
        step.offset = offset;
        step.scalar = kTypes[property->type].scalar;
        step.readCb = property->readCb;
        step.argument.element_ = &element;
        step.argument.property_ = property.get();
        step.argument.pdata_ = property->pdata;
        step.argument.idata_ = property->idata;
      }
      offset += kTypes[property->type].size;
    }
    // Small enough for the decoded values to stay in the first-level cache.
    constexpr long kRun = 256;
    const std::size_t stride = steps.size();
    std::vector<double> values(static_cast<std::size_t>(kRun) * stride);
    long index = 0;
    while (index < element.ninstances) {
      if (!fill(instanceSize)) {
        return truncated(element, nullptr, index);
      }
      long run = std::min(
          {element.ninstances - index, kRun, static_cast<long>(available() / instanceSize)});
      for (std::size_t s = 0; s < stride; ++s) {
        decodeRun<kSwap>(pos + steps[s].offset, instanceSize, run, steps[s].scalar,
                         values.data() + s, stride);
      }
      const double* value = values.data();
      for (long i = 0; i < run; ++i) {
        for (Step& step : steps) {
          step.argument.instanceIndex_ = index + i;
          step.argument.value_ = *value++;
          if (!step.readCb(&step.argument)) {
            return aborted(step.argument);
          }
        }
      }
      pos += static_cast<std::size_t>(run) * instanceSize;
      index += run;
    }
    return true;
  }

  // Instances with lists: property by property.
  template <bool kSwap>
  bool readBinary(PlyElement& element) {
    PlyArgument argument;
    argument.element_ = &element;
    for (long index = 0; index < element.ninstances; ++index) {
      argument.instanceIndex_ = index;
      for (const auto& owned : element.properties) {
        PlyProperty& property = *owned;
        argument.property_ = &property;
        argument.pdata_ = property.pdata;
        argument.idata_ = property.idata;
        const TypeInfo& type = kTypes[property.isList() ? property.lengthType : property.type];
        if (!fill(type.size)) {
          return truncated(element, &property, index);
        }
        double value = decode<kSwap>(pos, type.scalar);
        pos += type.size;
        if (!property.isList()) {
          if (property.readCb) {
            argument.length_ = 1;
            argument.valueIndex_ = 0;
            argument.value_ = value;
            if (!property.readCb(&argument)) {
              return aborted(argument);
            }
          }
          continue;
        }
        if (value < 0) {
          return fail("negative list length in element " + quoted(element.name) + ", property " +
                      quoted(property.name) + " (instance " + std::to_string(index) + ")");
        }
        // At most 2^32 - 1: the length type is an integer of 32 bits or less.
        long length = static_cast<long>(value);
        const TypeInfo& item = kTypes[property.valueType];
        if (!property.readCb) {
          if (!skip(static_cast<std::uint64_t>(length) * item.size)) {
            return truncated(element, &property, index);
          }
          continue;
        }
        argument.length_ = length;
        argument.valueIndex_ = -1;
        argument.value_ = value;
        if (!property.readCb(&argument)) {
          return aborted(argument);
        }
        for (long i = 0; i < length; ++i) {
          if (!fill(item.size)) {
            return truncated(element, &property, index);
          }
          argument.valueIndex_ = i;
          argument.value_ = decode<kSwap>(pos, item.scalar);
          pos += item.size;
          if (!property.readCb(&argument)) {
            return aborted(argument);
          }
        }
      }
    }
    return true;
  }

  enum class Token { Ok, End, Bad, Failed };

  // Reads more input while keeping the value that starts at pos.
  bool moreAscii() {
    if (available() >= kMaxAsciiValue) {
      return fail("an ASCII value is longer than " + std::to_string(kMaxAsciiValue) +
                  " characters");
    }
    fill(available() + 1);
    return !failed;
  }

  // The next whitespace-separated value, parsed as the scalar type says:
  // integers exactly (into `integer` too), float32 as a float, float64 as a
  // double.
  Token asciiValue(Scalar scalar, double& real, long long& integer) {
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

  bool skipAsciiValue() {
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

  bool asciiFailure(Token token, e_ply_type type, const PlyElement& element,
                    const PlyProperty& property, long index) {
    if (token == Token::Bad) {
      return fail("bad value " + quoted(badValue) + " for " + kTypes[type].name + " in element " +
                  quoted(element.name) + ", property " + quoted(property.name) + " (instance " +
                  std::to_string(index) + ")");
    }
    return truncated(element, &property, index);
  }

  bool readAscii(PlyElement& element) {
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

namespace {

const char* nextText(const std::string& texts, const char* last) {
  if (last == nullptr) {
    return texts.empty() ? nullptr : texts.c_str();
  }
  const char* next = last + std::strlen(last) + 1;
  return next < texts.c_str() + texts.size() ? next : nullptr;
}

}  // namespace

p_ply ply_open(const char* name, p_ply_error_cb error_cb, long idata, void* pdata) {
  auto reader = std::make_unique<PlyReader>(name ? name : "", error_cb, idata, pdata);
  if (!reader->openFile()) {
    return nullptr;
  }
  return reader.release();
}

p_ply ply_open_from_memory(const void* data, std::size_t size, const char* name,
                           p_ply_error_cb error_cb, long idata, void* pdata) {
  auto reader = std::make_unique<PlyReader>(name ? name : "", error_cb, idata, pdata);
  reader->openMemory(size > 0 ? data : "", size);
  return reader.release();
}

int ply_read_header(p_ply ply) {
  if (ply == nullptr) {
    return 0;
  }
  if (ply->state != PlyReader::State::Opened || ply->failed) {
    return ply->fail("the header can be read only once, right after opening");
  }
  ply->state = PlyReader::State::HeaderRead;
  return ply->readHeader() ? 1 : 0;
}

long ply_set_read_cb(p_ply ply, const char* element_name, const char* property_name,
                     p_ply_read_cb read_cb, void* pdata, long idata) {
  if (ply == nullptr || element_name == nullptr || property_name == nullptr) {
    return 0;
  }
  for (const auto& element : ply->elements) {
    if (element->name != element_name) {
      continue;
    }
    for (const auto& property : element->properties) {
      if (property->name == property_name) {
        property->readCb = read_cb;
        property->pdata = pdata;
        property->idata = idata;
        return element->ninstances;
      }
    }
    return 0;
  }
  return 0;
}

int ply_read(p_ply ply) {
  if (ply == nullptr) {
    return 0;
  }
  if (ply->state != PlyReader::State::HeaderRead || ply->failed) {
    return ply->fail("the data can be read only once, after the header");
  }
  ply->state = PlyReader::State::Read;
  return ply->readData() ? 1 : 0;
}

int ply_close(p_ply ply) {
  if (ply == nullptr) {
    return 0;
  }
  delete ply;
  return 1;
}

p_ply_element ply_get_next_element(p_ply ply, p_ply_element last) {
  if (ply == nullptr) {
    return nullptr;
  }
  std::size_t next = last == nullptr ? 0 : last->index + 1;
  if ((last != nullptr && last->reader != ply) || next >= ply->elements.size()) {
    return nullptr;
  }
  return ply->elements[next].get();
}

int ply_get_element_info(p_ply_element element, const char** name, long* ninstances) {
  if (element == nullptr) {
    return 0;
  }
  if (name) {
    *name = element->name.c_str();
  }
  if (ninstances) {
    *ninstances = element->ninstances;
  }
  return 1;
}

p_ply_property ply_get_next_property(p_ply_element element, p_ply_property last) {
  if (element == nullptr) {
    return nullptr;
  }
  std::size_t next = last == nullptr ? 0 : last->index + 1;
  if ((last != nullptr && last->element != element) || next >= element->properties.size()) {
    return nullptr;
  }
  return element->properties[next].get();
}

int ply_get_property_info(p_ply_property property, const char** name, e_ply_type* type,
                          e_ply_type* length_type, e_ply_type* value_type) {
  if (property == nullptr) {
    return 0;
  }
  if (name) {
    *name = property->name.c_str();
  }
  if (type) {
    *type = property->type;
  }
  if (length_type) {
    *length_type = property->lengthType;
  }
  if (value_type) {
    *value_type = property->valueType;
  }
  return 1;
}

const char* ply_get_next_comment(p_ply ply, const char* last) {
  return ply ? nextText(ply->comments, last) : nullptr;
}

const char* ply_get_next_obj_info(p_ply ply, const char* last) {
  return ply ? nextText(ply->objInfos, last) : nullptr;
}

e_ply_storage_mode ply_get_storage_mode(p_ply ply) { return ply ? ply->mode : PLY_ASCII; }

const char* ply_storage_mode_name(e_ply_storage_mode mode) {
  switch (mode) {
    case PLY_BIG_ENDIAN:
      return "binary_big_endian";
    case PLY_LITTLE_ENDIAN:
      return "binary_little_endian";
    case PLY_ASCII:
      return "ascii";
  }
  return "";
}

const char* ply_type_name(e_ply_type type) {
  if (type >= 0 && type < kScalarTypeCount) {
    return kTypes[type].name;
  }
  return type == PLY_LIST ? "list" : "";
}

int ply_get_ply_user_data(p_ply ply, void** pdata, long* idata) {
  if (ply == nullptr) {
    return 0;
  }
  if (pdata) {
    *pdata = ply->pdata;
  }
  if (idata) {
    *idata = ply->idata;
  }
  return 1;
}

}  // namespace cloudreel
