#include "import/ply_vertex_blocks.h"

#include <algorithm>
#include <bit>
#include <cstring>
#include <string_view>

namespace cloudreel {

namespace {

// The names the import reads, by the slot of the record they fill: x, y, z,
// red, green, blue.
constexpr int kSlots = 6;
constexpr int kBlue = 5;
struct SlotName {
  std::string_view name;
  int slot;
  bool diffuse;
};
constexpr SlotName kNames[] = {{"x", 0, false},          {"y", 1, false},
                               {"z", 2, false},          {"red", 3, false},
                               {"green", 4, false},      {"blue", 5, false},
                               {"diffuse_red", 3, true}, {"diffuse_green", 4, true},
                               {"diffuse_blue", 5, true}};

bool isFloat32(e_ply_type t) { return t == PLY_FLOAT || t == PLY_FLOAT32; }
bool isFloat64(e_ply_type t) { return t == PLY_DOUBLE || t == PLY_FLOAT64; }
bool isUint8(e_ply_type t) { return t == PLY_UCHAR || t == PLY_UINT8; }

p_ply_element firstVertexElement(p_ply ply) {
  for (p_ply_element element = ply_get_next_element(ply, nullptr); element != nullptr;
       element = ply_get_next_element(ply, element)) {
    const char* name = nullptr;
    ply_get_element_info(element, &name, nullptr);
    if (std::string_view(name) == "vertex") {
      return element;
    }
  }
  return nullptr;
}

// The float a float32 value of the file becomes on the callback path, which
// widens it to a double and narrows it back: the same value, except that a
// signalling NaN comes back quiet (its quiet bit set, its payload kept).
float throughDouble(std::uint32_t bits) {
  constexpr std::uint32_t kQuiet = 0x00400000;
  const bool nan = (bits & 0x7fffffffu) > 0x7f800000u;
  return std::bit_cast<float>(nan ? bits | kQuiet : bits);
}

template <typename Coordinate>
float coordinateAt(const char* p) {
  if constexpr (sizeof(Coordinate) == 4) {
    std::uint32_t bits;
    std::memcpy(&bits, p, sizeof bits);
    return throughDouble(bits);
  } else {
    double value;
    std::memcpy(&value, p, sizeof value);
    // Beyond a float's range it narrows to infinity; a NaN stays NaN.
    return static_cast<float>(value);
  }
}

}  // namespace

std::optional<PlyVertexBlockLayout> plyVertexBlockLayout(p_ply ply) {
  if (ply == nullptr || ply_get_storage_mode(ply) != PLY_LITTLE_ENDIAN ||
      std::endian::native != std::endian::little) {
    return std::nullopt;
  }
  p_ply_element vertex = firstVertexElement(ply);
  if (vertex == nullptr) {
    return std::nullopt;
  }
  PlyVertexBlockLayout layout;
  std::size_t offsets[kSlots] = {};
  e_ply_type types[kSlots] = {};
  int order[kSlots] = {};  // the property index of each slot's value
  bool seen[kSlots] = {};
  int diffuseNaming = -1;  // 0 or 1 once a colour name is seen
  int index = 0;
  for (p_ply_property property = ply_get_next_property(vertex, nullptr); property != nullptr;
       property = ply_get_next_property(vertex, property), ++index) {
    const char* name = nullptr;
    e_ply_type type = PLY_LIST;
    ply_get_property_info(property, &name, &type, nullptr, nullptr);
    if (type == PLY_LIST) {
      return std::nullopt;
    }
    const std::size_t at = layout.recordSize;
    layout.recordSize += ply_type_size(type);
    const auto known = std::find_if(std::begin(kNames), std::end(kNames),
                                    [name](const SlotName& s) { return s.name == name; });
    if (known == std::end(kNames)) {
      continue;
    }
    if (known->slot >= 3) {
      // Both namings would fill a record twice a vertex: left to the
      // callbacks, which do exactly that.
      if (diffuseNaming >= 0 && diffuseNaming != int{known->diffuse}) {
        return std::nullopt;
      }
      diffuseNaming = known->diffuse;
    }
    if (seen[known->slot]) {
      continue;  // a repeated name: only its first property is read
    }
    seen[known->slot] = true;
    offsets[known->slot] = at;
    types[known->slot] = type;
    order[known->slot] = index;
  }
  if (!std::all_of(std::begin(seen), std::end(seen), [](bool s) { return s; })) {
    return std::nullopt;
  }
  const bool floats = isFloat32(types[0]) && isFloat32(types[1]) && isFloat32(types[2]);
  const bool doubles = isFloat64(types[0]) && isFloat64(types[1]) && isFloat64(types[2]);
  if (!(floats || doubles) || !isUint8(types[3]) || !isUint8(types[4]) || !isUint8(types[5])) {
    return std::nullopt;
  }
  if (*std::max_element(std::begin(order), std::end(order)) != order[kBlue]) {
    return std::nullopt;
  }
  layout.doublePositions = doubles;
  ply_get_element_info(vertex, nullptr, &layout.vertexCount);
  layout.x = offsets[0];
  layout.y = offsets[1];
  layout.z = offsets[2];
  layout.red = offsets[3];
  layout.green = offsets[4];
  layout.blue = offsets[5];
  return layout;
}

PlyVertexDecoder::PlyVertexDecoder(const PlyVertexBlockLayout& layout, std::int32_t factor,
                                   color_point* points, std::int32_t capacity)
    : layout_(layout),
      factor_(std::max(factor, std::int32_t{1})),
      points_(points),
      capacity_(std::max(capacity, std::int32_t{0})) {}

void PlyVertexDecoder::attach(p_ply ply) { ply_set_block_cb(ply, "vertex", decodeBlock, this); }

Layer::BoundingBox PlyVertexDecoder::boundingBox() const {
  return {lo_[0], lo_[1], lo_[2], hi_[0], hi_[1], hi_[2]};
}

int PlyVertexDecoder::decodeBlock(const void* data, long first, long count, void* self) {
  auto& decoder = *static_cast<PlyVertexDecoder*>(self);
  const auto* bytes = static_cast<const char*>(data);
  const bool store = decoder.points_ != nullptr;
  if (decoder.layout_.doublePositions) {
    store ? decoder.decode<double, true>(bytes, first, count)
          : decoder.decode<double, false>(bytes, first, count);
  } else {
    store ? decoder.decode<float, true>(bytes, first, count)
          : decoder.decode<float, false>(bytes, first, count);
  }
  return 1;
}

// Vertices first .. first + count - 1 are in the block; of them, those that
// are a multiple of the factor and whose record is within the array become
// records. The records come in order, so the box grows as it would over the
// finished array.
template <typename Coordinate, bool kStore>
void PlyVertexDecoder::decode(const char* data, long first, long count) {
  // The first record whose vertex is in this block, and the one after the
  // last. first + count numbers vertices really read, far below 2^62, so
  // adding a factor below 2^31 cannot overflow.
  const long begin = (first + factor_ - 1) / factor_;
  const long end = std::min<long>((first + count + factor_ - 1) / factor_, capacity_);
  if (begin >= end) {
    return;
  }
  const std::size_t stride = layout_.recordSize * static_cast<std::size_t>(factor_);
  const char* p = data + static_cast<std::size_t>(begin * factor_ - first) * layout_.recordSize;
  const PlyVertexBlockLayout& l = layout_;
  if (begin == 0) {
    lo_[0] = hi_[0] = coordinateAt<Coordinate>(p + l.x);
    lo_[1] = hi_[1] = coordinateAt<Coordinate>(p + l.y);
    lo_[2] = hi_[2] = coordinateAt<Coordinate>(p + l.z);
  }
  float lo[3] = {lo_[0], lo_[1], lo_[2]};
  float hi[3] = {hi_[0], hi_[1], hi_[2]};
  // Null when measuring: no arithmetic on a null pointer.
  color_point* out = kStore ? points_ + begin : nullptr;
  for (long r = begin; r < end; ++r, p += stride) {
    const float xyz[3] = {coordinateAt<Coordinate>(p + l.x), coordinateAt<Coordinate>(p + l.y),
                          coordinateAt<Coordinate>(p + l.z)};
    if constexpr (kStore) {
      const color_point record{xyz[0],
                               xyz[1],
                               xyz[2],
                               static_cast<std::uint8_t>(p[l.red]),
                               static_cast<std::uint8_t>(p[l.green]),
                               static_cast<std::uint8_t>(p[l.blue]),
                               static_cast<std::uint8_t>(r)};
      std::memcpy(out++, &record, sizeof record);
    }
    for (int axis = 0; axis < 3; ++axis) {
      lo[axis] = xyz[axis] < lo[axis] ? xyz[axis] : lo[axis];
      hi[axis] = xyz[axis] > hi[axis] ? xyz[axis] : hi[axis];
    }
  }
  std::copy(lo, lo + 3, lo_);
  std::copy(hi, hi + 3, hi_);
  records_ = static_cast<std::int32_t>(end);
}

}  // namespace cloudreel
