#pragma once
// What `cloudreel info` tells about a point file, as plain data: the counts,
// record layout, bounding box and luck histogram of the layer the file
// opens as, and for a PLY file what its header declares. The info command
// prints it as text or JSON.

#include <array>
#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "platform/error.h"
#include "scene/layer.h"

namespace cloudreel {
class PointLayer;
}

namespace cloudreel::cli {

struct PlyPropertyDescription {
  std::string name;
  // The type as the header writes it: "float", "uchar", or for a list
  // "list <length type> <value type>" ("list uchar int").
  std::string type;
};

struct PlyElementDescription {
  std::string name;
  long count = 0;
  std::vector<PlyPropertyDescription> properties;
};

struct PlyHeaderDescription {
  // "ascii", "binary_little_endian" or "binary_big_endian".
  std::string format;
  std::vector<PlyElementDescription> elements;
};

struct PointCloudSummary {
  std::int32_t points = 0;
  std::int32_t faces = 0;
  // The record layout: 28-byte records with normals.
  bool hasNormals = false;
  Layer::BoundingBox bbox{};
  // How many records carry each luck value.
  std::array<std::uint64_t, 256> luckHistogram{};
  std::optional<PlyHeaderDescription> ply;
};

// The counts, layout, box and histogram of the layer's records. Only the
// records the array really holds are counted.
PointCloudSummary summarizePointLayer(const PointLayer& layer);

// Reads the header of the PLY file at `path`. On failure answers false with
// the reader's reason ("<path>: <what is wrong>") in the error.
[[nodiscard]] bool describePlyHeader(const std::filesystem::path& path,
                                     PlyHeaderDescription* header, Error* error);

}  // namespace cloudreel::cli
