#pragma once
// The point layer made from a PLY file: the positions and colours of the
// file's "vertex" element, read once into the layer's packed array when the
// layer is made. A file whose vertices have no colour gives white points.
// From then on it is an ordinary inline point layer that always has true
// colour and never writes itself back to a file; it archives and copies
// exactly as a PointLayer does.

#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <string_view>

#include "scene/point_layer.h"

namespace cloudreel {

class PLYFile : public PointLayer {
 public:
  // A blank layer, as a document being decoded makes it.
  PLYFile() = default;

  // The layer of every `factor`-th vertex of the PLY file at `url` (a factor
  // below 1 counts as 1), named after the file. Null when the file cannot be
  // opened, its header cannot be read, the array cannot be had or the data
  // cannot be read; the reader reports why on standard error ("RPly: ...").
  static std::shared_ptr<PLYFile> initWithURLDownsample(const std::filesystem::path& url,
                                                        std::int32_t factor);

  // How the vertex values reach the array. Automatic decodes whole records
  // in blocks where the layout allows it (ply_vertex_blocks.h) and hands
  // every value to a callback otherwise; Callbacks always does the latter,
  // the reference the block decoding must match.
  enum class VertexReading { Automatic, Callbacks };
  static std::shared_ptr<PLYFile> initWithURLDownsample(const std::filesystem::path& url,
                                                        std::int32_t factor, VertexReading reading);

  // The point count and bounding box initWithURLDownsample(url, factor)
  // would give the layer, found in one pass that keeps no records (the luck
  // bytes of the records would be their numbers modulo 256). Only for files
  // whose vertices are decoded in blocks; nullopt for any other, and for a
  // file that cannot be read, whose reason the reader prints on standard
  // error as the import would.
  struct Extent {
    std::int32_t nPoints = 0;
    BoundingBox bbox{};
  };
  static std::optional<Extent> measureURLDownsample(const std::filesystem::path& url,
                                                    std::int32_t factor);

  // Whether a property of the "vertex" element gives the points their
  // colour: a blue value, "blue" or "diffuse_blue", is what completes a
  // coloured vertex. Where the first "vertex" element has no such property
  // its red and green are not read either and every point is white.
  static bool propertyGivesColor(std::string_view name);

  std::string_view className() const override { return "PLYFile"; }

  bool hasTrueColor() const override { return true; }
  // Writes nothing and answers NO, which by the point file's inverted
  // convention means it succeeded: the PLY file is never rewritten.
  bool savePointsToURLError(const std::filesystem::path& url, Error* error) const override;
  // Does nothing: the layer has no file of its own to save to.
  void saveLinkedLayer() override {}

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
};

}  // namespace cloudreel
