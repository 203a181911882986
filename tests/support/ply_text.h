#pragma once
// PLY files written by the tests: any elements of typed scalar and list
// properties, in ASCII or either binary byte order, with a chosen line end
// and extra header lines (comments, obj_info).

#include <algorithm>
#include <bit>
#include <charconv>
#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

namespace cloudreel::testing {

struct PlyProperty {
  std::string type;
  std::string name;
  std::string lengthType = "";  // empty for a scalar
};

// A coloured point's properties: x, y, z as floats, red, green, blue as bytes.
inline const std::vector<PlyProperty> kPlyXyzRgb = {{"float", "x"},     {"float", "y"},
                                                    {"float", "z"},     {"uchar", "red"},
                                                    {"uchar", "green"}, {"uchar", "blue"}};

// Each instance is its values in file order; a list gives its length first.
// Values are written as the property's type holds them, so an integer
// type's value must lie in its range.
struct PlyElement {
  std::string name;
  std::vector<PlyProperty> properties;
  std::vector<std::vector<double>> instances;
};

inline void putPlyValue(std::string& out, const std::string& type, double v,
                        const std::string& format) {
  if (format == "ascii") {
    char text[64];
    char* end = type == "float" || type == "float32" ? std::to_chars(text, text + 64, float(v)).ptr
                : type == "double" || type == "float64"
                    ? std::to_chars(text, text + 64, v).ptr
                    : std::to_chars(text, text + 64, static_cast<long long>(v)).ptr;
    out.append(text, end).push_back(' ');
    return;
  }
  auto bytes = [&](auto x) {
    char b[sizeof x];
    std::memcpy(b, &x, sizeof x);
    if ((format == "binary_big_endian") != (std::endian::native == std::endian::big)) {
      std::reverse(b, b + sizeof x);
    }
    out.append(b, sizeof x);
  };
  if (type == "char" || type == "int8") bytes(std::int8_t(v));
  if (type == "uchar" || type == "uint8") bytes(std::uint8_t(v));
  if (type == "short" || type == "int16") bytes(std::int16_t(v));
  if (type == "ushort" || type == "uint16") bytes(std::uint16_t(v));
  if (type == "int" || type == "int32") bytes(std::int32_t(v));
  if (type == "uint" || type == "uint32") bytes(std::uint32_t(v));
  if (type == "float" || type == "float32") bytes(float(v));
  if (type == "double" || type == "float64") bytes(v);
}

inline std::string plyText(const std::vector<PlyElement>& elements, const std::string& format,
                           const std::string& eol = "\n", const std::string& extraHeader = "") {
  std::string out = "ply" + eol + "format " + format + " 1.0" + eol + extraHeader;
  for (const auto& e : elements) {
    out += "element " + e.name + " " + std::to_string(e.instances.size()) + eol;
    for (const auto& p : e.properties) {
      out += "property " + (p.lengthType.empty() ? "" : "list " + p.lengthType + " ") + p.type +
             " " + p.name + eol;
    }
  }
  out += "end_header" + eol;
  for (const auto& e : elements) {
    for (const auto& values : e.instances) {
      std::size_t v = 0;
      for (const auto& p : e.properties) {
        std::size_t items = p.lengthType.empty() ? 1 : std::size_t(values[v]);
        if (!p.lengthType.empty()) putPlyValue(out, p.lengthType, values[v++], format);
        for (std::size_t i = 0; i < items; ++i) putPlyValue(out, p.type, values[v++], format);
      }
      if (format == "ascii") out += eol;
    }
  }
  return out;
}

}  // namespace cloudreel::testing
