#pragma once
// The cached drawing of a point layer: what its drawGLWithOptions replays
// frame after frame until one of the rebuild triggers (a new luck threshold,
// a new draw or colour mode, a new point size, an explicit invalidation)
// asks for it to be built again.
//
// Spheres and meshes are display lists. Plain points, the mode that serves
// clouds of tens of millions, live in one vertex buffer in which the records
// are ordered by luck byte: the points drawn at threshold t (luck < t) are
// then exactly the first start[t] vertices, so a drawing for any threshold
// is one glDrawArrays of a prefix. A new threshold rebuilds the drawing
// (point size, attenuation, colour mode and fixed colour are taken anew) but
// re-uploads nothing when the records and the opacity baked into the buffer
// are those it already holds. Compared with a display list of glVertex
// calls this keeps one copy of the cloud on the GPU (a list keeps it in the
// driver's own format, usually larger), builds with two sequential passes
// over the records, and makes a bucket-limit change cost no more than a
// frame.

#include <array>
#include <cstddef>
#include <cstdint>

#include "render/gl/display_list.h"
#include "render/gl/vertex_buffer.h"

namespace cloudreel {

// A layer's records copied into a vertex buffer in luck order (a stable
// counting sort: within one luck value the records keep their order).
// Records without normals become 16 bytes: position as three floats and
// red, green, blue, alpha as bytes, alpha being the layer's opacity. Records
// with normals become 40 bytes: position, normal, and the colour as four
// floats (red/255, green/255, blue/255, opacity), the material colour of a
// lit point.
class LuckOrderedPoints {
 public:
  // What an upload is made from; two equal sources give the same buffer.
  struct Source {
    const void* array = nullptr;   // identity of the point array
    std::uint64_t generation = 0;  // bumped whenever the records change
    const std::uint8_t* records = nullptr;
    std::size_t count = 0;
    bool withNormals = false;
    float opacity = 1.0f;
    friend bool operator==(const Source& a, const Source& b) {
      return a.array == b.array && a.generation == b.generation && a.records == b.records &&
             a.count == b.count && a.withNormals == b.withNormals && a.opacity == b.opacity;
    }
  };

  // True when the buffer holds `source` and the current context can draw it.
  bool holds(const Source& source) const;
  // Copies the records into a new buffer in the current context. False when
  // the driver refused the memory; nothing is drawn then.
  bool upload(const Source& source);
  void reset();
  // True after a successful upload that the current context can draw.
  bool isUsable() const;

  // Records whose luck is below `threshold` (0 for thresholds of 0 or
  // below, all for 256 and above).
  std::size_t countBelow(std::int32_t threshold) const;
  // Draws the records whose luck is below `threshold` as points: positions,
  // normals when the records have them, and the per-point colours when
  // `withColours`.
  void draw(std::int32_t threshold, bool withColours) const;

 private:
  gl::VertexBuffer buffer_;
  Source source_;
  bool valid_ = false;
  // start_[l] = number of records whose luck is below l.
  std::array<std::size_t, 257> start_{};
};

// Everything a point layer keeps of its drawing between frames.
struct PointDrawingCache {
  enum class Kind { None, Points, Spheres, Mesh };

  // What the current drawing is; None until it is built.
  Kind kind = Kind::None;
  // The drawing of spheres or of the mesh.
  gl::DisplayList list;
  // The one sphere every point of a sphere drawing calls.
  gl::DisplayList sphere;
  gl::DisplayList boundingBox;
  LuckOrderedPoints points;

  // The state a points drawing was built with and replays.
  std::int32_t threshold = 0;
  float pointSize = 1.0f;
  std::array<float, 3> attenuation{1.0f, 0.0f, 0.0f};
  std::int32_t colorMode = 0;
  std::array<float, 3> fixedColor{};
  bool withNormals = false;
  // The layer's opacity when the drawing was built: the alpha of its points.
  float opacity = 1.0f;

  // True when there is a drawing the current context can replay.
  bool isUsable() const;
};

}  // namespace cloudreel
