#pragma once
// What `cloudreel info` tells about a point file, as plain data: the counts,
// record layout, bounding box and luck histogram of the layer the file
// opens as, the cameras of its camera field when it has one, and for a PLY
// or bundle file what its header declares. The info command prints it as
// text or JSON.

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
  // Whether the imported points carry the file's colours: false when the
  // first "vertex" element has no blue value (or there is none), and the
  // import makes every point white.
  bool hasColor = false;
};

// What a bundle file's header line claims; the file may hold fewer.
struct BundleHeaderDescription {
  std::int64_t cameras = 0;
  std::int64_t points = 0;
};

struct CameraDescription {
  // The camera's number: its place in the file's camera list.
  int index = 0;
  // In pixels, and the radial distortion; 0 for a camera without a lens.
  double focal = 0.0;
  double k1 = 0.0;
  double k2 = 0.0;
  // Where the camera stands, in world coordinates.
  std::array<double, 3> centre{};
  // In degrees, as the camera answers it: from the photograph's width, so a
  // camera without a photograph answers a small negative angle.
  float fieldOfView = 0.0f;
  // The photograph's width and height in pixels, when it could be read.
  std::optional<std::array<int, 2>> image;
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
  // Present when the layer's first child is a camera field (a bundle file's
  // layer), in the field's order.
  std::optional<std::vector<CameraDescription>> cameras;
  std::optional<BundleHeaderDescription> bundle;
};

// The counts, layout, box and histogram of the layer's records, and its
// camera field's cameras. Only the records the array really holds are
// counted.
PointCloudSummary summarizePointLayer(const PointLayer& layer);

// The summary of the layer a PLY file imports as (every vertex), taken in
// one pass that keeps no records, where the file's vertex layout allows it
// (PLYFile::measureURLDownsample). Nullopt otherwise, and for a file that
// cannot be read, which the import then reports; anything the reader
// printed is held back.
std::optional<PointCloudSummary> measurePlyPointCloud(const std::filesystem::path& path);

// Reads the header of the PLY file at `path`. On failure answers false with
// the reader's reason ("<path>: <what is wrong>") in the error.
[[nodiscard]] bool describePlyHeader(const std::filesystem::path& path,
                                     PlyHeaderDescription* header, Error* error);

// Reads the counts line of the bundle file at `path`. The import reads any
// text as a bundle file (a file without counts is one of no cameras and no
// points), so this is what tells a bundle file from anything else. On
// failure answers false with the reason, naming the file: "x.out: not a
// bundle file (...)", or for a file without even a first line the import's
// own "File corrupt: short read".
[[nodiscard]] bool describeBundleHeader(const std::filesystem::path& path,
                                        BundleHeaderDescription* header, Error* error);

}  // namespace cloudreel::cli
