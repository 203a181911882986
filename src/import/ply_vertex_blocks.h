#pragma once
// The fast way into a PLY point layer. Reconstructions write their vertices
// as fixed-size binary records: x, y, z as float or double, maybe normals,
// red, green, blue as bytes, maybe more properties after them. Such records
// are decoded here straight into the layer's packed array, a block of them
// at a time as the reader hands them over, numbering the luck bytes and
// growing the bounding box in the same pass. Everything else goes through
// the reader's per-value callbacks (ply_file.cpp), and for the layouts
// accepted here both ways give the same records, byte for byte, and the
// same box.

#include <cstddef>
#include <cstdint>
#include <optional>

#include "import/ply/ply.h"
#include "scene/layer.h"
#include "scene/point_layer.h"

namespace cloudreel {

// Where the values the import keeps lie in a record of the first "vertex"
// element, in bytes from the record's start.
struct PlyVertexBlockLayout {
  std::size_t recordSize = 0;
  std::size_t x = 0, y = 0, z = 0;
  std::size_t red = 0, green = 0, blue = 0;
  // float64 coordinates (narrowed to float), else float32.
  bool doublePositions = false;
  // The element's instance count, as the header declares it.
  long vertexCount = 0;
};

// The layout of the file's vertex records when they can be decoded in
// blocks, once its header has been read: binary little-endian data on a
// little-endian machine; a first "vertex" element without lists; x, y and
// z all float or all double; red, green and blue (or their "diffuse_"
// names, but not both namings) as uchar, with blue after the other five so
// that it completes each vertex as the callbacks have it. Other properties
// may lie anywhere and are passed over, as are repeats of a name (only the
// first of a name is read). Nullopt for any other file.
std::optional<PlyVertexBlockLayout> plyVertexBlockLayout(p_ply ply);

// Decodes the blocks of vertex records the reader hands over into records:
// every factor-th vertex k becomes record k / factor, while there is room
// for it, with luck byte record number modulo 256. Without an array it only
// measures: it counts and boxes the records an import would make.
class PlyVertexDecoder {
 public:
  // `points` holds `capacity` records, or is null to measure only. A factor
  // below 1 counts as 1.
  PlyVertexDecoder(const PlyVertexBlockLayout& layout, std::int32_t factor, color_point* points,
                   std::int32_t capacity);

  // Registers the decoder as the block callback of the first "vertex"
  // element; it must outlive the read.
  void attach(p_ply ply);

  // The records decoded so far, and their box: record 0 to begin with,
  // grown axis by axis by every later record, the minimum only where a
  // coordinate is strictly smaller and the maximum only where strictly
  // larger (so a NaN coordinate never moves it). All zeros before any.
  std::int32_t records() const { return records_; }
  Layer::BoundingBox boundingBox() const;

 private:
  static int decodeBlock(const void* data, long first, long count, void* self);
  // kStore: write the records, not only measure them.
  template <typename Coordinate, bool kStore>
  void decode(const char* data, long first, long count);

  PlyVertexBlockLayout layout_;
  long factor_ = 1;
  color_point* points_ = nullptr;
  std::int32_t capacity_ = 0;
  std::int32_t records_ = 0;
  float lo_[3] = {0, 0, 0};
  float hi_[3] = {0, 0, 0};
};

}  // namespace cloudreel
