#include "render/gl/shapes.h"

#include <epoxy/gl.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <numbers>
#include <vector>

#include "render/gl/teapot_data.h"

namespace cloudreel::gl {
namespace {

struct Vec3 {
  double x = 0, y = 0, z = 0;
};

Vec3 cross(Vec3 a, Vec3 b) {
  return {a.y * b.z - a.z * b.y, a.z * b.x - a.x * b.z, a.x * b.y - a.y * b.x};
}
double length(Vec3 a) { return std::sqrt(a.x * a.x + a.y * a.y + a.z * a.z); }

bool usableSize(double size) { return std::isfinite(size) && size > 0.0; }
int clampSubdivisions(int n) { return std::min(n, kMaxSubdivisions); }

void vertex(Vec3 normal, Vec3 position) {
  glNormal3d(normal.x, normal.y, normal.z);
  glVertex3d(position.x, position.y, position.z);
}

// cos and sin of 2πj/n for j = 0..n, the last equal to the first exactly so
// that rings close without a crack.
struct Circle {
  std::vector<double> cosines;
  std::vector<double> sines;

  explicit Circle(int n) : cosines(static_cast<std::size_t>(n) + 1), sines(cosines.size()) {
    for (int j = 0; j < n; ++j) {
      const double angle = 2.0 * std::numbers::pi * j / n;
      cosines[static_cast<std::size_t>(j)] = std::cos(angle);
      sines[static_cast<std::size_t>(j)] = std::sin(angle);
    }
    cosines.back() = cosines.front();
    sines.back() = sines.front();
  }
  double c(int j) const { return cosines[static_cast<std::size_t>(j)]; }
  double s(int j) const { return sines[static_cast<std::size_t>(j)]; }
};

// The unit sphere's point at stack k (0 at +z) and slice j.
Vec3 spherePoint(const Circle& around, int k, int stacks, int j) {
  const double polar = std::numbers::pi * k / stacks;
  const double ring = std::sin(polar);
  return {around.c(j) * ring, around.s(j) * ring, std::cos(polar)};
}

Vec3 scaled(Vec3 v, double f) { return {v.x * f, v.y * f, v.z * f}; }

}  // namespace

void drawSolidSphere(double radius, int slices, int stacks) {
  if (!usableSize(radius) || slices < 3 || stacks < 2) {
    return;
  }
  slices = clampSubdivisions(slices);
  stacks = clampSubdivisions(stacks);
  const Circle around(slices);
  // Each band runs upper then lower point per slice: counter-clockwise seen
  // from outside.
  for (int k = 0; k < stacks; ++k) {
    glBegin(GL_TRIANGLE_STRIP);
    for (int j = 0; j <= slices; ++j) {
      const Vec3 upper = spherePoint(around, k, stacks, j);
      const Vec3 lower = spherePoint(around, k + 1, stacks, j);
      vertex(upper, scaled(upper, radius));
      vertex(lower, scaled(lower, radius));
    }
    glEnd();
  }
}

void drawWireSphere(double radius, int slices, int stacks) {
  if (!usableSize(radius) || slices < 3 || stacks < 2) {
    return;
  }
  slices = clampSubdivisions(slices);
  stacks = clampSubdivisions(stacks);
  const Circle around(slices);
  for (int k = 1; k < stacks; ++k) {
    glBegin(GL_LINE_LOOP);
    for (int j = 0; j < slices; ++j) {
      const Vec3 p = spherePoint(around, k, stacks, j);
      vertex(p, scaled(p, radius));
    }
    glEnd();
  }
  for (int j = 0; j < slices; ++j) {
    glBegin(GL_LINE_STRIP);
    for (int k = 0; k <= stacks; ++k) {
      const Vec3 p = spherePoint(around, k, stacks, j);
      vertex(p, scaled(p, radius));
    }
    glEnd();
  }
}

void drawSolidCube(double edge) {
  if (!usableSize(edge)) {
    return;
  }
  const double h = edge / 2.0;
  struct Face {
    Vec3 normal;
    // Two in-face axes whose cross product is the normal, so the corners
    // below run counter-clockwise seen from outside.
    Vec3 u;
    Vec3 v;
  };
  static constexpr std::array<Face, 6> kFaces = {{
      {{1, 0, 0}, {0, 1, 0}, {0, 0, 1}},
      {{-1, 0, 0}, {0, 0, 1}, {0, 1, 0}},
      {{0, 1, 0}, {0, 0, 1}, {1, 0, 0}},
      {{0, -1, 0}, {1, 0, 0}, {0, 0, 1}},
      {{0, 0, 1}, {1, 0, 0}, {0, 1, 0}},
      {{0, 0, -1}, {0, 1, 0}, {1, 0, 0}},
  }};
  static constexpr std::array<std::array<double, 2>, 4> kCorners = {
      {{-1, -1}, {1, -1}, {1, 1}, {-1, 1}}};
  glBegin(GL_QUADS);
  for (const Face& face : kFaces) {
    for (const auto& corner : kCorners) {
      vertex(face.normal, {h * (face.normal.x + corner[0] * face.u.x + corner[1] * face.v.x),
                           h * (face.normal.y + corner[0] * face.u.y + corner[1] * face.v.y),
                           h * (face.normal.z + corner[0] * face.u.z + corner[1] * face.v.z)});
    }
  }
  glEnd();
}

void drawSolidCone(double baseRadius, double height, int slices, int stacks) {
  if (!usableSize(baseRadius) || !usableSize(height) || slices < 3 || stacks < 1) {
    return;
  }
  slices = clampSubdivisions(slices);
  stacks = clampSubdivisions(stacks);
  const Circle around(slices);
  // The base faces -z; seen from below, decreasing angles run
  // counter-clockwise.
  glBegin(GL_TRIANGLE_FAN);
  vertex({0, 0, -1}, {0, 0, 0});
  for (int j = slices; j >= 0; --j) {
    vertex({0, 0, -1}, {baseRadius * around.c(j), baseRadius * around.s(j), 0});
  }
  glEnd();
  // The side's normal leans up by the slope: perpendicular to the line from
  // the rim to the apex.
  const double slant = std::hypot(baseRadius, height);
  const double radial = height / slant;
  const double up = baseRadius / slant;
  for (int k = 0; k < stacks; ++k) {
    const double zLow = height * k / stacks;
    const double zHigh = height * (k + 1) / stacks;
    const double rLow = baseRadius * (stacks - k) / stacks;
    const double rHigh = baseRadius * (stacks - k - 1) / stacks;
    glBegin(GL_TRIANGLE_STRIP);
    for (int j = 0; j <= slices; ++j) {
      const Vec3 normal{radial * around.c(j), radial * around.s(j), up};
      vertex(normal, {rHigh * around.c(j), rHigh * around.s(j), zHigh});
      vertex(normal, {rLow * around.c(j), rLow * around.s(j), zLow});
    }
    glEnd();
  }
}

namespace {

constexpr int kTeapotGrid = 10;

std::array<double, 4> bernstein(double t) {
  const double s = 1.0 - t;
  return {s * s * s, 3 * t * s * s, 3 * t * t * s, t * t * t};
}
std::array<double, 4> bernsteinDerivative(double t) {
  const double s = 1.0 - t;
  return {-3 * s * s, 3 * s * s - 6 * t * s, 6 * t * s - 3 * t * t, 3 * t * t};
}

// Evaluates one patch (rows indexed by u, columns by v) with the given
// basis functions in each direction.
Vec3 evaluate(const std::array<std::uint16_t, 16>& patch, const std::array<double, 4>& bu,
              const std::array<double, 4>& bv) {
  Vec3 sum;
  for (std::size_t i = 0; i < 4; ++i) {
    for (std::size_t j = 0; j < 4; ++j) {
      const auto& p = teapot::kPoints[patch[i * 4 + j]];
      const double w = bu[i] * bv[j];
      sum.x += w * p[0];
      sum.y += w * p[1];
      sum.z += w * p[2];
    }
  }
  return sum;
}

// Newell's patches all face inwards under u × v, so the outward normal is
// ∂P/∂v × ∂P/∂u. Where a row of control points collapses to one point (the
// lid's knob, the bottom's centre) that product vanishes; the normal a hair
// inside the patch is the limit there.
Vec3 outwardNormal(const std::array<std::uint16_t, 16>& patch, double u, double v) {
  for (double nudge : {0.0, 1e-3, 1e-2}) {
    const double uu = u < 0.5 ? u + nudge : u - nudge;
    const Vec3 n = cross(evaluate(patch, bernstein(uu), bernsteinDerivative(v)),
                         evaluate(patch, bernsteinDerivative(uu), bernstein(v)));
    const double len = length(n);
    if (len > 1e-9) {
      return scaled(n, 1.0 / len);
    }
  }
  return {0, 0, 1};
}

// From the patch data's frame (z up, base at z = 0) to the drawn one: up
// is +y, the middle of the height at the origin.
Vec3 rotateToFrame(Vec3 p) { return {p.x, p.z, -p.y}; }
Vec3 teapotFrame(Vec3 p, double scale) { return scaled(rotateToFrame({p.x, p.y, p.z - 1.5}), scale); }

}  // namespace

void drawSolidTeapot(double size) {
  if (!usableSize(size)) {
    return;
  }
  const double scale = 0.5 * size;
  constexpr int n = kTeapotGrid;
  std::array<Vec3, (n + 1) * (n + 1)> positions;
  std::array<Vec3, (n + 1) * (n + 1)> normals;
  for (const auto& patch : teapot::kPatches) {
    for (int i = 0; i <= n; ++i) {
      const double u = static_cast<double>(i) / n;
      for (int j = 0; j <= n; ++j) {
        const double v = static_cast<double>(j) / n;
        const auto at = static_cast<std::size_t>(i * (n + 1) + j);
        positions[at] = teapotFrame(evaluate(patch, bernstein(u), bernstein(v)), scale);
        normals[at] = rotateToFrame(outwardNormal(patch, u, v));
      }
    }
    // Strips along v, row i + 1 then row i: counter-clockwise seen from
    // outside given the inward u × v of the data.
    for (int i = 0; i < n; ++i) {
      glBegin(GL_TRIANGLE_STRIP);
      for (int j = 0; j <= n; ++j) {
        for (int row : {i + 1, i}) {
          const auto at = static_cast<std::size_t>(row * (n + 1) + j);
          vertex(normals[at], positions[at]);
        }
      }
      glEnd();
    }
  }
}

}  // namespace cloudreel::gl
