#pragma once
// Placing a camera so that a box of the scene is in view: the command line's
// import places a new document's scene camera this way, and the document
// view's "Frame Scene" does it for every visible layer.
//
// The camera keeps its orientation and moves back along its own viewing
// axis (it looks down its local -z) from the box's centre, far enough that
// the box's bounding sphere fits inside the narrower of its two fields of
// view with a margin; its near and far planes close around the sphere.

#include <array>
#include <optional>

#include "scene/layer.h"

namespace cloudreel {

class Camera;

// Whether a box can be framed: every value finite, each minimum at most
// its maximum, and not a single point (which has no size to fit).
bool isFramableBox(const Layer::BoundingBox& box);

// Grows `total` to hold `box`; a box that cannot be framed is left out, so
// a union of nothing framable stays empty.
void addBoxToUnion(std::optional<Layer::BoundingBox>& total, const Layer::BoundingBox& box);

// The layer's own box carried into the world by its placement
// (objectToWorld · animationTransform · inertialToObject), as the axis-aligned
// box around its eight corners. Pending editing transforms are not counted.
Layer::BoundingBox worldBoundingBoxOfLayer(const Layer& layer);

struct CameraFraming {
  std::array<double, 3> position{};
  float zNear = 1.0f;
  float zFar = 30.0f;
};

// Where the camera goes to see `box` whole. The field of view is clamped to
// 1°..179° (a camera without a usable one would need an infinite distance),
// and read as spanning the shorter side of the picture when the camera's
// aspect is 1 (as the views draw it); an aspect below 1 narrows the sideways
// view. A box that cannot be framed gives the camera's present place.
CameraFraming framingOfBoxForCamera(const Camera& camera, const Layer::BoundingBox& box);

// Applies framingOfBoxForCamera: position, near and far. Not undoable by
// itself; the callers decide.
void frameBoxWithCamera(Camera& camera, const Layer::BoundingBox& box);

}  // namespace cloudreel
