#pragma once
// The virtual trackball: a pointer drag over the view turns the scene as if
// rolling a ball under the pointer. One drag state is shared process-wide,
// since only one drag happens at a time; a trackball started during another
// drag takes it over. Pointer positions are in the view's coordinates, y
// growing upwards.

#include <array>
#include <cstdint>

#include "geometry/rotations.h"

namespace cloudreel {

struct TrackballDragState {
  std::int64_t centreX = 0;
  std::int64_t centreY = 0;
  float radius = 0.0f;  // pixels
  std::array<float, 3> start{};
  std::array<float, 3> current{};
};

// The shared drag state (main thread only).
TrackballDragState& trackballDragState();

// Starts a drag at the pointer over a viewport. Pointers outside the ball lie
// on its equator plane.
void trackballBegin(std::int64_t px, std::int64_t py, int originX, int originY, int width,
                    int height);
// The rotation from the drag's start to the pointer, as an axis-angle in
// degrees. A move under 0.001 pixels in both directions leaves the output
// untouched.
void trackballRoll(std::int64_t px, std::int64_t py, AxisAngle& out);
// Folds a drag's rotation into the accumulated one: the drag applies after it.
void trackballAddRotation(const AxisAngle& drag, AxisAngle& accumulated);

}  // namespace cloudreel
