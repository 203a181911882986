#include "import/ply_file.h"

#if defined(__x86_64__)
#include <emmintrin.h>
#endif

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <iterator>
#include <limits>
#include <optional>
#include <vector>

#include "import/ply/ply.h"
#include "import/ply_vertex_blocks.h"
#include "platform/file_location.h"

namespace cloudreel {

namespace {

// A float64 coordinate beyond a float's range narrows to ±infinity and a NaN
// stays NaN, as IEEE 754 arithmetic defines; neither can fault.
static_assert(std::numeric_limits<float>::is_iec559 && std::numeric_limits<double>::is_iec559);

// The vertex properties read, and the slot each one's values go to. A
// coordinate that completes a vertex (see below) goes to its slot plus
// kCompletingCoordinate instead.
struct Slot {
  const char* name;
  long slot;
};
// clang-format off
constexpr Slot kSlots[] = {{"x", 0}, {"y", 1}, {"z", 2},
                           {"diffuse_red", 3}, {"red", 3},
                           {"diffuse_green", 4}, {"green", 4},
                           {"diffuse_blue", 5}, {"blue", 5}};
// clang-format on
constexpr long kBlueSlot = 5;
constexpr long kCompletingCoordinate = 6;

// What the read callback fills. A blue value completes a vertex; in a file
// without blue, the last coordinate of the element does. Every factor-th
// vertex is kept, vertex k going to record k / factor.
struct ReadContext {
  color_point* points = nullptr;
  // The record being filled. It stops at `capacity`, so it cannot overflow
  // however many vertices a file completes.
  std::int32_t index = 0;
  std::int32_t capacity = 0;
  std::int32_t factor = 1;
  // Vertices completed since the record being filled was started.
  std::int32_t completed = 0;
  // points + index, or `spare` for a vertex that is skipped or has no record
  // left. The header's count may be smaller than what the first "vertex"
  // element (the one the callbacks are bound to) delivers, and a file with
  // both colour namings completes every vertex twice: such values land in
  // `spare` rather than past the array.
  color_point* target = nullptr;
  color_point spare{};
};

// Numbers and boxes the first `count` records, and makes them white when
// the file gave them no colour. Luck numbers them 0-255 over and over. The
// box starts as record 0 and grows, axis by axis, by every later record: the
// minimum only where a coordinate is strictly smaller, the maximum only
// where strictly larger, so a NaN coordinate never moves it. Floats compare
// as their doubles do, and the selects compile to min and max instructions
// rather than branches.
Layer::BoundingBox finishRecords(color_point* points, std::int32_t count, bool white) {
  float lo[3] = {points[0].x, points[0].y, points[0].z};
  float hi[3] = {lo[0], lo[1], lo[2]};
  for (std::int32_t i = 0; i < count; ++i) {
    color_point& p = points[i];
    p.luck = static_cast<std::uint8_t>(i);
    if (white) {
      p.r = p.g = p.b = 255;
    }
    const float xyz[3] = {p.x, p.y, p.z};
    for (int axis = 0; axis < 3; ++axis) {
      lo[axis] = xyz[axis] < lo[axis] ? xyz[axis] : lo[axis];
      hi[axis] = xyz[axis] > hi[axis] ? xyz[axis] : hi[axis];
    }
  }
  return {lo[0], lo[1], lo[2], hi[0], hi[1], hi[2]};
}

// The low byte of the value truncated to a 64-bit integer. A NaN, an
// infinity or a value beyond the 64-bit range has no such integer and
// stores 0. On x86-64 the truncating conversion instruction gives exactly
// that (its out-of-range answer is 0x8000000000000000, low byte 0) and, as
// an intrinsic, is defined for every input; elsewhere the value is clamped
// to the range's ends, whose low bytes are 0, a NaN going to the lower end.
std::uint8_t colorByte(double value) {
#if defined(__x86_64__)
  return static_cast<std::uint8_t>(_mm_cvttsd_si64(_mm_set_sd(value)));
#else
  constexpr double kLowest = -0x1p63;
  constexpr double kHighest = 0x1p63 - 1024.0;  // the largest double below 2^63
  double clamped = value > kLowest ? value : kLowest;
  clamped = clamped < kHighest ? clamped : kHighest;
  return static_cast<std::uint8_t>(static_cast<std::int64_t>(clamped));
#endif
}

// Ends the vertex being read. Every factor-th vertex is kept and the next
// record begun; the vertices between are read into the spare record.
void completeVertex(ReadContext& context) {
  if (++context.completed < context.factor) {
    context.target = &context.spare;
    return;
  }
  context.completed = 0;
  if (context.index < context.capacity) {
    ++context.index;
  }
  context.target =
      context.index < context.capacity ? context.points + context.index : &context.spare;
}

// Called for every value of the registered properties, so kept to a switch
// and a store.
int storeVertexValue(p_ply_argument argument) {
  void* pdata = nullptr;
  long slot = 0;
  ply_get_argument_user_data(argument, &pdata, &slot);
  auto* context = static_cast<ReadContext*>(pdata);
  const double value = ply_get_argument_value(argument);
  color_point& record = *context->target;
  switch (slot) {
    case 0:
      record.x = static_cast<float>(value);
      break;
    case 1:
      record.y = static_cast<float>(value);
      break;
    case 2:
      record.z = static_cast<float>(value);
      break;
    case 3:
      record.r = colorByte(value);
      break;
    case 4:
      record.g = colorByte(value);
      break;
    case kBlueSlot:
      record.b = colorByte(value);
      completeVertex(*context);
      break;
    case kCompletingCoordinate + 0:
      record.x = static_cast<float>(value);
      completeVertex(*context);
      break;
    case kCompletingCoordinate + 1:
      record.y = static_cast<float>(value);
      completeVertex(*context);
      break;
    case kCompletingCoordinate + 2:
      record.z = static_cast<float>(value);
      completeVertex(*context);
      break;
    default:
      break;
  }
  return 1;
}

// The properties of the "vertex" element the callbacks are bound to (the
// first one) that are read, in the element's property order, with their
// slots. Only the first property of a name is read, as the callbacks are
// bound by name. The names belong to the open reader.
struct VertexLayout {
  std::vector<Slot> read;
  bool hasColor = false;
};

// Without a blue value the element's colour is not read at all and the last
// of x, y and z completes each vertex: z in every real file, but a file that
// lists its coordinates in another order still gives one record a vertex.
VertexLayout vertexLayout(p_ply_element element) {
  VertexLayout layout;
  for (p_ply_property property = ply_get_next_property(element, nullptr); property != nullptr;
       property = ply_get_next_property(element, property)) {
    const char* name = nullptr;
    ply_get_property_info(property, &name, nullptr, nullptr, nullptr);
    const auto named = [name](const Slot& s) { return std::strcmp(name, s.name) == 0; };
    const Slot* known = std::find_if(std::begin(kSlots), std::end(kSlots), named);
    if (known == std::end(kSlots) || std::any_of(layout.read.begin(), layout.read.end(), named)) {
      continue;
    }
    layout.read.push_back({name, known->slot});
    layout.hasColor = layout.hasColor || PLYFile::propertyGivesColor(name);
  }
  if (!layout.hasColor) {
    std::erase_if(layout.read, [](const Slot& s) { return s.slot > 2; });
    if (!layout.read.empty()) {
      layout.read.back().slot += kCompletingCoordinate;
    }
  }
  return layout;
}

bool isVertexElement(p_ply_element element) {
  const char* name = nullptr;
  ply_get_element_info(element, &name, nullptr);
  return std::strcmp(name, "vertex") == 0;
}

}  // namespace

std::shared_ptr<PLYFile> PLYFile::initWithURLDownsample(const std::filesystem::path& url,
                                                        std::int32_t factor) {
  return initWithURLDownsample(url, factor, VertexReading::Automatic);
}

std::shared_ptr<PLYFile> PLYFile::initWithURLDownsample(const std::filesystem::path& url,
                                                        std::int32_t factor,
                                                        VertexReading reading) {
  auto layer = std::make_shared<PLYFile>();
  factor = std::max(factor, std::int32_t{1});
  layer->setName(lastPathComponent(url));

  // The reader reports its own failures on standard error.
  PlyHandle ply(ply_open(url.c_str(), nullptr, 0, nullptr));
  if (!ply || !ply_read_header(ply.get())) {
    return nullptr;
  }

  ReadContext context;
  context.factor = factor;
  context.target = &context.spare;
  long vertexCount = 0;
  bool hasColor = true;
  p_ply_element vertex = ply_get_next_element(ply.get(), nullptr);
  while (vertex != nullptr && !isVertexElement(vertex)) {
    vertex = ply_get_next_element(ply.get(), vertex);
  }
  const std::optional<PlyVertexBlockLayout> blocks =
      reading == VertexReading::Automatic ? plyVertexBlockLayout(ply.get()) : std::nullopt;
  if (blocks) {
    // The count "x" would answer: the first "vertex" element's.
    vertexCount = blocks->vertexCount;
  } else if (vertex != nullptr) {
    const VertexLayout layout = vertexLayout(vertex);
    hasColor = layout.hasColor;
    for (const Slot& slot : layout.read) {
      const long count =
          ply_set_read_cb(ply.get(), "vertex", slot.name, storeVertexValue, &context, slot.slot);
      if (slot.slot == 0 || slot.slot == kCompletingCoordinate) {
        vertexCount = count;
      }
    }
  }

  // A count whose records an int32 cannot number is refused as memory that
  // cannot be had (the allocation refuses -1).
  const long n = vertexCount / factor;
  const bool countable = n <= std::numeric_limits<std::int32_t>::max();
  auto* points = reinterpret_cast<color_point*>(
      layer->allocatePointArrayWithSize(countable ? static_cast<std::int32_t>(n) : -1));
  if (points == nullptr) {
    return nullptr;
  }
  context.points = points;
  context.capacity = static_cast<std::int32_t>(n);
  if (n > 0) {
    context.target = points;
  }
  // The decoder fills the records, their luck and the box as the blocks
  // arrive; only the callbacks leave that to a pass over the array after.
  std::optional<PlyVertexDecoder> decoder;
  if (blocks) {
    decoder.emplace(*blocks, factor, points, static_cast<std::int32_t>(n));
    decoder->attach(ply.get());
  }
  if (!ply_read(ply.get())) {
    return nullptr;
  }
  ply.reset();
  if (decoder) {
    if (n > 0) {
      layer->setBoundingBox(decoder->boundingBox());
    }
    layer->setNPoints(static_cast<std::int32_t>(n));
    return layer;
  }

  // Every record is numbered and boxed, those the read never reached (a
  // file with both colour namings fills only the first half) with their
  // zeroed contents; a file without colour gives every record white.
  // Downsampled, a record's luck is its own number, not its vertex's, and
  // only the array's records are touched. With no records, as when the
  // factor exceeds the vertex count, the box stays as a blank layer's.
  if (n > 0) {
    layer->setBoundingBox(finishRecords(points, static_cast<std::int32_t>(n), !hasColor));
  }
  layer->setNPoints(static_cast<std::int32_t>(n));
  return layer;
}

std::optional<PLYFile::Extent> PLYFile::measureURLDownsample(const std::filesystem::path& url,
                                                             std::int32_t factor) {
  factor = std::max(factor, std::int32_t{1});
  PlyHandle ply(ply_open(url.c_str(), nullptr, 0, nullptr));
  if (!ply || !ply_read_header(ply.get())) {
    return std::nullopt;
  }
  const std::optional<PlyVertexBlockLayout> blocks = plyVertexBlockLayout(ply.get());
  if (!blocks) {
    return std::nullopt;
  }
  // As in the import, a count an int32 cannot number is refused.
  const long n = blocks->vertexCount / factor;
  if (n > std::numeric_limits<std::int32_t>::max()) {
    return std::nullopt;
  }
  PlyVertexDecoder decoder(*blocks, factor, nullptr, static_cast<std::int32_t>(n));
  decoder.attach(ply.get());
  if (!ply_read(ply.get())) {
    return std::nullopt;
  }
  Extent extent;
  extent.nPoints = static_cast<std::int32_t>(n);
  // With no records the box stays as a blank layer's.
  if (n > 0) {
    extent.bbox = decoder.boundingBox();
  }
  return extent;
}

bool PLYFile::propertyGivesColor(std::string_view name) {
  return name == "blue" || name == "diffuse_blue";
}

bool PLYFile::savePointsToURLError(const std::filesystem::path&, Error*) const { return false; }

std::shared_ptr<Animatable3DObject> PLYFile::makeBlank() const {
  return std::make_shared<PLYFile>();
}

}  // namespace cloudreel
