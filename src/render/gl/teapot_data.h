#pragma once
// The control points of Martin Newell's teapot (1975, public domain): 32
// bicubic Bezier patches over 306 points, z up, the spout towards +x.

#include <array>
#include <cstdint>

namespace cloudreel::gl::teapot {

inline constexpr int kPatchCount = 32;
inline constexpr int kPointCount = 306;

// Each patch: 4 rows of 4 indices into kPoints (zero-based).
extern const std::array<std::array<std::uint16_t, 16>, kPatchCount> kPatches;
extern const std::array<std::array<float, 3>, kPointCount> kPoints;

}  // namespace cloudreel::gl::teapot
