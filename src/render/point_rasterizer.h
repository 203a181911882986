#pragma once
// Plain points placed on the CPU, on every core, into a frame that OpenGL
// drew: one square of whole pixels per point, one colour, one depth, tested
// against the depth already there. A point costs a handful of arithmetic
// operations and one pixel write, where a general rasteriser in software
// sets up and bins a primitive per point, so a large cloud draws ten or
// more times faster this way on a machine without a GPU.
//
// The arithmetic is that of Mesa's software rasteriser (llvmpipe), step by
// step, so that the frame is byte for byte the one it would have drawn:
//   - the projection and model-view matrices are multiplied in single
//     precision, each element a sum of four products left to right;
//   - a point's clip coordinates are the same sums over the combined
//     matrix, x, y and z terms then the translation, without fused
//     multiply-adds;
//   - points outside -w <= x, y, z <= w are dropped;
//   - window coordinates are (clip / w) × half size + (origin + half size),
//     x / w taken as x × (1 / w), the scale and offset as one fused
//     multiply-add where the processor has one (as the rasteriser's
//     compiled code does) and as a product and a sum where it has not;
//   - the position is snapped to 1/256 of a pixel; a point of size N covers
//     the pixels whose centres c have p - N/2 < c <= p + N/2 along each
//     axis (p the snapped position);
//   - depth is the window z clamped to [0, 1] and made a 32-bit unsigned
//     normalised value as that rasteriser makes it: z × 2^31 truncated to
//     an integer i, then 2i - (i >> 31), which maps 1 to 0xffffffff;
//   - the depth test is "less": a point is written where its depth is
//     below the depth there, and then writes its depth and colour.
// Where two points of one drawing have exactly the same depth at a pixel
// the earlier record wins here, while OpenGL draws a layer's points in
// luck order; such ties are the only difference.

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

namespace cloudreel {

// A frame as OpenGL reads it back: the bottom row first, colour as RGBA
// bytes (red in the lowest byte of each word), depth as 32-bit unsigned
// normalised values.
struct PointRasterTarget {
  int width = 0;
  int height = 0;
  std::uint32_t* colour = nullptr;
  std::uint32_t* depth = nullptr;
};

// One layer's points and the state it draws them with.
struct PointRasterBatch {
  // Column-major, as OpenGL keeps them.
  std::array<float, 16> projection{};
  std::array<float, 16> modelView{};
  // x, y, width, height in pixels.
  std::array<int, 4> viewport{};
  // Records of 16 bytes: x, y, z as floats, then red, green, blue and the
  // luck byte.
  const std::uint8_t* records = nullptr;
  std::size_t count = 0;
  // Records whose luck is below it are drawn.
  std::int32_t luckThreshold = 0;
  // Whole pixels across, at least 1.
  int pointSize = 1;
  // Every point in this colour (RGBA bytes as in the target) instead of its
  // own, when set.
  bool useFixedColour = false;
  std::uint32_t fixedColour = 0;
};

// The combined matrix projection × model-view as OpenGL forms it.
std::array<float, 16> combinedMatrix(const std::array<float, 16>& projection,
                                     const std::array<float, 16>& modelView);

// A colour component in [0, 1] as the byte the rasteriser writes: clamped,
// scaled by 255 and rounded to nearest, ties to even.
std::uint8_t colourByte(float component);

// The 32-bit depth value of a window z.
std::uint32_t depthValue(float windowZ);

class PointRasterizer {
 public:
  // How the work is divided; the frame does not depend on it.
  struct Division {
    // Threads at most; 0 takes one per core.
    unsigned threads = 0;
    // Fewer points than this a thread are drawn on fewer threads: starting
    // a thread costs more than it saves.
    std::size_t pointsPerThread = 16384;
    // Points a thread projects between two writing phases, at most.
    std::size_t chunk = std::size_t{1} << 20;
  };

  PointRasterizer() : PointRasterizer(Division{}) {}
  explicit PointRasterizer(Division division);

  // Draws the batches into the target, in order. False, with the target
  // untouched, when the working memory cannot be had.
  bool draw(const PointRasterTarget& target, std::span<const PointRasterBatch> batches);

  // A point's pixels, clipped to the frame, with what it writes there: the
  // working data between projecting and writing.
  struct Fragment {
    std::uint16_t x0, x1, y0, y1;
    std::uint32_t depth;
    std::uint32_t colour;
  };

 private:
  bool prepare(const PointRasterTarget& target, unsigned threads, std::size_t points);
  void drawBatch(const PointRasterTarget& target, const PointRasterBatch& batch, unsigned threads);

  Division division_;
  // Per thread and band: the fragments of the current chunk of points.
  std::vector<std::vector<Fragment>> bins_;
  std::vector<Fragment*> binPointers_;
  std::vector<std::vector<std::size_t>> binCounts_;
  // The band of each row.
  std::vector<std::uint16_t> bandOfRow_;
  std::vector<int> bandStart_;
  std::size_t chunk_ = 0;
};

}  // namespace cloudreel
