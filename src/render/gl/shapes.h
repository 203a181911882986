#pragma once
// The solid and wire shapes that viewers draw as markers and props, in
// immediate mode with a unit normal at every vertex (for fixed-function
// lighting) and triangles counter-clockwise seen from outside (so back-face
// culling works). Sizes, axes and subdivisions follow the classic toolkit
// shapes that the scene descriptions assume. Wrap calls in a DisplayList to
// cache them.
//
// Degenerate requests draw nothing: a size that is not positive and finite,
// fewer than 3 slices, fewer than 2 stacks for a sphere or 1 for a cone.
// Subdivisions above kMaxSubdivisions are clamped to it, so a stray huge
// value cannot stall the program.

namespace cloudreel::gl {

inline constexpr int kMaxSubdivisions = 1024;

// Centred at the origin; slices around the z axis, stacks from +z to -z.
void drawSolidSphere(double radius, int slices, int stacks);
// The same sphere as lines: stacks - 1 circles of latitude and `slices`
// half-circles of longitude from pole to pole.
void drawWireSphere(double radius, int slices, int stacks);
// Centred at the origin, faces perpendicular to the axes.
void drawSolidCube(double edge);
// Base disc in the z = 0 plane centred on the origin, apex at z = height.
void drawSolidCone(double baseRadius, double height, int slices, int stacks);
// Newell's teapot, `size` times the classic proportions: up is +y, the
// spout points towards +x, centred vertically about the origin (the body
// spans y from -0.75 * size to 0.825 * size at the lid knob).
void drawSolidTeapot(double size);

}  // namespace cloudreel::gl
