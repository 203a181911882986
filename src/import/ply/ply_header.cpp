// The PLY header: the magic line, the format, elements with their scalar
// and list properties, comments and obj_info lines, up to "end_header";
// then the check that the data the header declares can fit in the file.

#include <algorithm>
#include <charconv>
#include <cstring>
#include <string>
#include <system_error>

#include "import/ply/ply_reader.h"

namespace cloudreel {

using namespace ply_detail;

namespace {

bool typeFromName(std::string_view name, e_ply_type& type) {
  for (int i = 0; i < kScalarTypeCount; ++i) {
    if (name == kTypes[i].name) {
      type = static_cast<e_ply_type>(i);
      return true;
    }
  }
  return false;
}

}  // namespace

// The next line without its line end (LF or CR LF).
bool PlyReader::readLine(std::string_view& line) {
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

bool PlyReader::readHeader() {
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
      ok =
          fail("header line " + std::to_string(lineNumber) + " is not understood: " + quoted(line));
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

bool PlyReader::parseFormat(std::string_view format, std::string_view version) {
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

bool PlyReader::parseElement(std::string_view elementName, std::string_view countText) {
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

bool PlyReader::parseProperty(const std::string_view* words, std::size_t count) {
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
bool PlyReader::checkDataSize() {
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
}  // namespace cloudreel
