#include "import/ply_file.h"

#if defined(__x86_64__)
#include <emmintrin.h>
#endif

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <limits>

#include "import/ply/ply.h"
#include "platform/file_location.h"

namespace cloudreel {

namespace {

// A float64 coordinate beyond a float's range narrows to ±infinity and a NaN
// stays NaN, as IEEE 754 arithmetic defines; neither can fault.
static_assert(std::numeric_limits<float>::is_iec559 && std::numeric_limits<double>::is_iec559);

// The vertex properties read, and the slot each one's values go to.
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

// What the read callback fills. A blue value completes a vertex; every
// factor-th vertex is kept, vertex k going to record k / factor.
struct ReadContext {
  color_point* points = nullptr;
  // The record being filled. It stops at `capacity`, so it cannot overflow
  // however many blue values a file holds.
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

// Numbers and boxes the first `count` records. Luck numbers them 0-255 over
// and over. The box starts as record 0 and grows, axis by axis, by every
// later record: the minimum only where a coordinate is strictly smaller,
// the maximum only where strictly larger, so a NaN coordinate never moves
// it. Floats compare as their doubles do, and the selects compile to min
// and max instructions rather than branches.
Layer::BoundingBox finishRecords(color_point* points, std::int32_t count) {
  float lo[3] = {points[0].x, points[0].y, points[0].z};
  float hi[3] = {lo[0], lo[1], lo[2]};
  for (std::int32_t i = 0; i < count; ++i) {
    color_point& p = points[i];
    p.luck = static_cast<std::uint8_t>(i);
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
    case 5:
      record.b = colorByte(value);
      if (++context->completed < context->factor) {
        context->target = &context->spare;
        break;
      }
      context->completed = 0;
      if (context->index < context->capacity) {
        ++context->index;
      }
      context->target =
          context->index < context->capacity ? context->points + context->index : &context->spare;
      break;
    default:
      break;
  }
  return 1;
}

}  // namespace

std::shared_ptr<PLYFile> PLYFile::initWithURLDownsample(const std::filesystem::path& url,
                                                        std::int32_t factor) {
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
  for (p_ply_element element = ply_get_next_element(ply.get(), nullptr); element != nullptr;
       element = ply_get_next_element(ply.get(), element)) {
    const char* elementName = nullptr;
    ply_get_element_info(element, &elementName, nullptr);
    if (std::strcmp(elementName, "vertex") != 0) {
      continue;
    }
    for (p_ply_property property = ply_get_next_property(element, nullptr); property != nullptr;
         property = ply_get_next_property(element, property)) {
      const char* propertyName = nullptr;
      ply_get_property_info(property, &propertyName, nullptr, nullptr, nullptr);
      for (const Slot& slot : kSlots) {
        if (std::strcmp(propertyName, slot.name) != 0) {
          continue;
        }
        const long count =
            ply_set_read_cb(ply.get(), "vertex", slot.name, storeVertexValue, &context, slot.slot);
        if (slot.slot == 0) {
          vertexCount = count;
        }
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
  if (!ply_read(ply.get())) {
    return nullptr;
  }
  ply.reset();

  // Every record is numbered and boxed, those the read never reached (a
  // file without colour fills only record 0) with their zeroed contents.
  // Downsampled, a record's luck is its own number, not its vertex's, and
  // only the array's records are touched. With no records, as when the
  // factor exceeds the vertex count, the box stays as a blank layer's.
  if (n > 0) {
    layer->setBoundingBox(finishRecords(points, static_cast<std::int32_t>(n)));
  }
  layer->setNPoints(static_cast<std::int32_t>(n));
  return layer;
}

bool PLYFile::savePointsToURLError(const std::filesystem::path&, Error*) const { return false; }

std::shared_ptr<Animatable3DObject> PLYFile::makeBlank() const {
  return std::make_shared<PLYFile>();
}

}  // namespace cloudreel
