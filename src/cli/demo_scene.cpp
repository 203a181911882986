#include "cli/demo_scene.h"

#include <stb/stb_image_write.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <functional>
#include <memory>
#include <numbers>
#include <string_view>
#include <system_error>

#include "platform/atomic_file.h"

namespace cloudreel::cli {

namespace {

using std::numbers::pi;

// The world places the scene's own coordinates (ground at y = 0 around the
// origin) so that the resting scene camera, at the world origin, stands
// 14 units from the middle at eye height 1.6.
constexpr double kEyeHeight = 1.6;
constexpr double kSceneDistance = 14.0;
// Half the side of the square of ground.
constexpr double kGroundHalfSide = 12.0;
// Objects are sampled this many times as densely as the ground, so their
// edges stay crisp in a thinned cloud.
constexpr double kObjectDensity = 2.5;
constexpr double kFocal = 260.0;
constexpr std::uint64_t kSeed = 0x5EED'C10D'4EE1ULL;

DemoVector toWorld(const DemoVector& p) { return {p[0], p[1] - kEyeHeight, p[2] - kSceneDistance}; }

DemoVector add(const DemoVector& a, const DemoVector& b) {
  return {a[0] + b[0], a[1] + b[1], a[2] + b[2]};
}
DemoVector subtract(const DemoVector& a, const DemoVector& b) {
  return {a[0] - b[0], a[1] - b[1], a[2] - b[2]};
}
DemoVector scaled(const DemoVector& a, double s) { return {a[0] * s, a[1] * s, a[2] * s}; }
double dot(const DemoVector& a, const DemoVector& b) {
  return a[0] * b[0] + a[1] * b[1] + a[2] * b[2];
}
DemoVector cross(const DemoVector& a, const DemoVector& b) {
  return {a[1] * b[2] - a[2] * b[1], a[2] * b[0] - a[0] * b[2], a[0] * b[1] - a[1] * b[0]};
}
DemoVector normalized(const DemoVector& a) { return scaled(a, 1.0 / std::sqrt(dot(a, a))); }

// Right, up and backward axes of a camera at `eye` looking at `target`
// with +y up (never straight up or down here).
std::array<DemoVector, 3> lookAt(const DemoVector& eye, const DemoVector& target) {
  const DemoVector forward = normalized(subtract(target, eye));
  const DemoVector right = normalized(cross(forward, {0.0, 1.0, 0.0}));
  return {right, cross(right, forward), scaled(forward, -1.0)};
}

// splitmix64: tiny, fast and the same everywhere, unlike the standard
// library's distributions.
class Random {
 public:
  explicit Random(std::uint64_t seed) : state_(seed) {}
  std::uint64_t next() {
    std::uint64_t z = (state_ += 0x9E3779B97F4A7C15ULL);
    z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ULL;
    z = (z ^ (z >> 27)) * 0x94D049BB133111EBULL;
    return z ^ (z >> 31);
  }
  // Uniform in [0, 1).
  double uniform() { return static_cast<double>(next() >> 11) * 0x1.0p-53; }
  double between(double a, double b) { return a + (b - a) * uniform(); }

 private:
  std::uint64_t state_;
};

struct Rgb {
  double r, g, b;
};

Rgb mix(const Rgb& a, const Rgb& b, double t) {
  return {a.r + (b.r - a.r) * t, a.g + (b.g - a.g) * t, a.b + (b.b - a.b) * t};
}
Rgb shade(const Rgb& c, double f) { return {c.r * f, c.g * f, c.b * f}; }

struct Sample {
  DemoVector position;
  Rgb color;
};

// A surface of the scene: its area (scene units squared), how densely it is
// sampled, and a sampler of uniformly spread points on it.
struct Surface {
  double area;
  double density;
  std::function<Sample(Random&)> sample;
};

// --- the ground

double smoothstep(double s) {
  s = std::clamp(s, 0.0, 1.0);
  return s * s * (3.0 - 2.0 * s);
}

// Flat where the objects stand, rising into low hills towards the edges.
double groundHeight(double x, double z) {
  const double rise = smoothstep((std::hypot(x, z) - 7.0) / 5.0);
  return 0.9 * rise * (0.7 + 0.3 * std::sin(3.0 * std::atan2(z, x) + 0.5));
}

// The house's footprint, where the ground is hidden.
constexpr double kHouseX = -3.2, kHouseZ = -1.0, kHouseWidth = 3.4, kHouseDepth = 2.6;
constexpr double kWallHeight = 2.2, kRidgeHeight = 3.5;

bool underHouse(double x, double z) {
  return std::abs(x - kHouseX) < kHouseWidth / 2 && std::abs(z - kHouseZ) < kHouseDepth / 2;
}

// A point of the ground within x0..x1, z0..z1.
Sample groundSample(Random& random, double x0, double x1, double z0, double z1) {
  double x = 0.0, z = 0.0;
  do {
    x = random.between(x0, x1);
    z = random.between(z0, z1);
  } while (underHouse(x, z));
  const double tx = (x + kGroundHalfSide) / (2 * kGroundHalfSide);
  const double tz = (z + kGroundHalfSide) / (2 * kGroundHalfSide);
  Rgb base = mix(mix({92, 156, 74}, {64, 138, 150}, tz), {210, 170, 92}, 0.6 * tx);
  const double y = groundHeight(x, z);
  base = mix(base, {118, 104, 76}, 0.6 * smoothstep((std::hypot(x, z) - 7.0) / 5.0));
  constexpr double kTile = 1.5;
  const auto parity = static_cast<long>(std::floor(x / kTile) + std::floor(z / kTile)) & 1;
  return {{x, y, z}, shade(base, parity != 0 ? 1.12 : 0.8)};
}

// --- flat pieces: a parallelogram o + a·u + b·v, coloured by (a, b) in
// scene units along u and v.

Surface parallelogram(DemoVector o, DemoVector u, DemoVector v,
                      std::function<Rgb(double, double)> color, bool triangle = false) {
  const double lu = std::sqrt(dot(u, u)), lv = std::sqrt(dot(v, v));
  const double area = std::sqrt(dot(cross(u, v), cross(u, v))) * (triangle ? 0.5 : 1.0);
  return {area, kObjectDensity, [=](Random& random) {
            double a = random.uniform(), b = random.uniform();
            if (triangle && a + b > 1.0) {
              a = 1.0 - a;
              b = 1.0 - b;
            }
            return Sample{add(o, add(scaled(u, a), scaled(v, b))), color(a * lu, b * lv)};
          }};
}

constexpr Rgb kBrick{172, 70, 50};
constexpr Rgb kMortar{205, 196, 184};

// Courses 0.25 high with joints every 0.5, staggered course by course.
Rgb brickwork(double along, double up) {
  const double course = std::floor(up / 0.25);
  const double joint = std::fmod(along + (std::fmod(course, 2.0) != 0.0 ? 0.25 : 0.0), 0.5);
  const bool mortar = up - course * 0.25 < 0.03 || joint < 0.03;
  return mortar ? kMortar : shade(kBrick, 0.9 + 0.2 * std::fmod(course * 0.37, 1.0));
}

// A window: white frame, blue glass.
bool windowAt(double along, double up, double centre, Rgb& color) {
  constexpr double kHalfWidth = 0.35, kBottom = 0.9, kTop = 1.7, kFrame = 0.06;
  if (std::abs(along - centre) > kHalfWidth || up < kBottom || up > kTop) {
    return false;
  }
  const bool frame = std::abs(along - centre) > kHalfWidth - kFrame || up < kBottom + kFrame ||
                     up > kTop - kFrame || std::abs(along - centre) < kFrame / 2;
  color = frame ? Rgb{240, 238, 230} : Rgb{150, 196, 228};
  return true;
}

void addHouse(std::vector<Surface>& surfaces) {
  const double x0 = kHouseX - kHouseWidth / 2, x1 = kHouseX + kHouseWidth / 2;
  const double z0 = kHouseZ - kHouseDepth / 2, z1 = kHouseZ + kHouseDepth / 2;
  // The front (+z) has the door between two windows; the back two windows.
  surfaces.push_back(parallelogram(
      {x0, 0, z1}, {kHouseWidth, 0, 0}, {0, kWallHeight, 0}, [](double along, double up) {
        Rgb c{};
        if (std::abs(along - kHouseWidth / 2) < 0.4 && up < 1.65) {
          return up > 1.58 ? Rgb{240, 238, 230} : Rgb{96, 58, 36};
        }
        if (windowAt(along, up, 0.7, c) || windowAt(along, up, kHouseWidth - 0.7, c)) {
          return c;
        }
        return brickwork(along, up);
      }));
  surfaces.push_back(parallelogram(
      {x1, 0, z0}, {-kHouseWidth, 0, 0}, {0, kWallHeight, 0}, [](double along, double up) {
        Rgb c{};
        if (windowAt(along, up, 1.0, c) || windowAt(along, up, kHouseWidth - 1.0, c)) {
          return c;
        }
        return brickwork(along, up);
      }));
  // The gable ends: a wall and the triangle above it.
  for (const double x : {x0, x1}) {
    surfaces.push_back(
        parallelogram({x, 0, z0}, {0, 0, kHouseDepth}, {0, kWallHeight, 0}, brickwork));
    surfaces.push_back(parallelogram({x, kWallHeight, z0}, {0, 0, kHouseDepth},
                                     {0, kRidgeHeight - kWallHeight, kHouseDepth / 2}, brickwork,
                                     true));
  }
  // Two roof slopes from the ridge down past the walls, in rows of slate.
  constexpr double kOverhang = 0.18;
  for (const double side : {-1.0, 1.0}) {
    surfaces.push_back(
        parallelogram({x0 - kOverhang, kRidgeHeight, kHouseZ}, {kHouseWidth + 2 * kOverhang, 0, 0},
                      {0, kWallHeight - 0.12 - kRidgeHeight, side * (kHouseDepth / 2 + kOverhang)},
                      [](double, double down) {
                        const bool edge = std::fmod(down, 0.22) < 0.03;
                        return shade({66, 76, 108}, edge ? 0.7 : 1.0 + 0.1 * std::sin(down * 9.0));
                      }));
  }
}

constexpr Rgb kMarble{236, 232, 222};

void addColonnade(std::vector<Surface>& surfaces) {
  constexpr double kZ = -3.4, kRadius = 0.24, kHeight = 2.8;
  for (int i = 0; i < 5; ++i) {
    const double cx = 1.2 + 1.0 * i;
    surfaces.push_back({2 * pi * kRadius * kHeight, kObjectDensity, [=](Random& random) {
                          const double a = random.between(0.0, 2 * pi);
                          const double y = random.between(0.0, kHeight);
                          // Sixteen flutes, darker in their hollows.
                          const double flute = std::pow(std::cos(8.0 * a), 2.0);
                          return Sample{{cx + kRadius * std::cos(a), y, kZ + kRadius * std::sin(a)},
                                        shade(kMarble, 0.78 + 0.22 * flute)};
                        }});
  }
  // The lintel across their tops, a terracotta band along its faces.
  constexpr double x0 = 0.8, x1 = 5.6, y0 = kHeight, y1 = kHeight + 0.4;
  constexpr double z0 = kZ - 0.32, z1 = kZ + 0.32;
  const auto band = [](double, double up) {
    return std::abs(up - 0.2) < 0.06 ? Rgb{184, 92, 58} : kMarble;
  };
  const auto plain = [](double, double) { return shade(kMarble, 0.95); };
  surfaces.push_back(parallelogram({x0, y0, z1}, {x1 - x0, 0, 0}, {0, y1 - y0, 0}, band));
  surfaces.push_back(parallelogram({x1, y0, z0}, {x0 - x1, 0, 0}, {0, y1 - y0, 0}, band));
  surfaces.push_back(parallelogram({x0, y1, z0}, {x1 - x0, 0, 0}, {0, 0, z1 - z0}, plain));
  surfaces.push_back(parallelogram({x0, y0, z0}, {x1 - x0, 0, 0}, {0, 0, z1 - z0}, plain));
  for (const double x : {x0, x1}) {
    surfaces.push_back(parallelogram({x, y0, z0}, {0, 0, z1 - z0}, {0, y1 - y0, 0}, plain));
  }
}

constexpr DemoVector kBallCentre{2.6, 1.0, 1.8};
constexpr double kBallRadius = 1.0;
constexpr std::array<Rgb, 6> kBallPanels{{{222, 52, 40},
                                          {242, 240, 232},
                                          {40, 92, 204},
                                          {246, 206, 40},
                                          {242, 240, 232},
                                          {56, 168, 80}}};

void addBall(std::vector<Surface>& surfaces) {
  surfaces.push_back(
      {4 * pi * kBallRadius * kBallRadius, kObjectDensity, [](Random& random) {
         const double y = random.between(-1.0, 1.0);
         const double a = random.between(0.0, 2 * pi);
         const double ring = std::sqrt(1.0 - y * y);
         const auto panel = std::min<std::size_t>(
             static_cast<std::size_t>(a / (2 * pi) * kBallPanels.size()), kBallPanels.size() - 1);
         const Rgb color = std::abs(y) > 0.94 ? kBallPanels[1] : kBallPanels[panel];
         return Sample{
             add(kBallCentre, scaled({ring * std::cos(a), y, ring * std::sin(a)}, kBallRadius)),
             color};
       }});
}

void addTree(std::vector<Surface>& surfaces, double x, double z, double scale) {
  const double trunkRadius = 0.16 * scale, trunkHeight = 1.0 * scale;
  const double crownRadius = 1.1 * scale, crownBase = 0.8 * scale, crownTop = 3.4 * scale;
  const double y = groundHeight(x, z);
  surfaces.push_back({2 * pi * trunkRadius * trunkHeight, kObjectDensity, [=](Random& random) {
                        const double a = random.between(0.0, 2 * pi);
                        return Sample{
                            {x + trunkRadius * std::cos(a), y + random.between(0.0, trunkHeight),
                             z + trunkRadius * std::sin(a)},
                            shade({108, 74, 44}, random.between(0.85, 1.05))};
                      }});
  const double slant = std::hypot(crownRadius, crownTop - crownBase);
  surfaces.push_back({pi * crownRadius * slant, kObjectDensity, [=](Random& random) {
                        // The area grows linearly from the apex, so the
                        // distance from it goes as the square root.
                        const double s = std::sqrt(random.uniform());
                        const double a = random.between(0.0, 2 * pi);
                        const double tiers = std::fmod(s * 4.0, 1.0);
                        return Sample{{x + s * crownRadius * std::cos(a),
                                       y + crownTop - s * (crownTop - crownBase),
                                       z + s * crownRadius * std::sin(a)},
                                      shade({44, 118, 52}, 0.7 + 0.4 * tiers)};
                      }});
}

std::vector<Surface> sceneSurfaces() {
  std::vector<Surface> surfaces;
  constexpr double kSide = kGroundHalfSide;
  surfaces.push_back({4 * kSide * kSide, 1.0, [](Random& random) {
                        return groundSample(random, -kSide, kSide, -kSide, kSide);
                      }});
  // The ground the resting camera looks down on from close by is sampled
  // three times as densely, or its points would spread into dots a few
  // pixels apart at the bottom of the picture.
  constexpr double kApronHalfWidth = 8.0, kApronNear = 4.0;
  surfaces.push_back({2 * kApronHalfWidth * (kSide - kApronNear), 2.0, [](Random& random) {
                        return groundSample(random, -kApronHalfWidth, kApronHalfWidth, kApronNear,
                                            kSide);
                      }});
  addHouse(surfaces);
  addColonnade(surfaces);
  addBall(surfaces);
  addTree(surfaces, -6.4, 2.6, 1.0);
  addTree(surfaces, 6.6, -6.2, 1.2);
  addTree(surfaces, -5.4, -6.8, 0.9);
  return surfaces;
}

std::uint8_t channel(double v, double noise) {
  return static_cast<std::uint8_t>(std::clamp(std::lround(v * noise), 0L, 255L));
}

DemoCamera cameraAt(const DemoVector& eye, const DemoVector& target) {
  DemoCamera camera;
  camera.focal = kFocal;
  camera.rotation = lookAt(toWorld(eye), toWorld(target));
  camera.centre = toWorld(eye);
  return camera;
}

// --- the bundle file

// Text is gathered in a buffer and handed to the file a few megabytes at a
// time: one call per number would dominate writing a million points.
class TextWriter {
 public:
  explicit TextWriter(std::FILE* file) : file_(file) { buffer_.reserve(kChunk + 256); }

  void text(std::string_view s) { buffer_.append(s); }
  void integer(long long v) { put(std::to_chars(scratch_, scratch_ + sizeof scratch_, v)); }
  // Fixed notation with `digits` decimals.
  void fixed(double v, int digits) {
    put(std::to_chars(scratch_, scratch_ + sizeof scratch_, v, std::chars_format::fixed, digits));
  }
  // The shortest text that reads back as the same double.
  void exact(double v) { put(std::to_chars(scratch_, scratch_ + sizeof scratch_, v)); }
  void endLine() {
    buffer_.push_back('\n');
    if (buffer_.size() >= kChunk) {
      flush();
    }
  }
  // False once any write failed.
  bool flush() {
    if (!buffer_.empty() &&
        std::fwrite(buffer_.data(), 1, buffer_.size(), file_) != buffer_.size()) {
      ok_ = false;
    }
    buffer_.clear();
    return ok_;
  }

 private:
  static constexpr std::size_t kChunk = std::size_t{4} << 20;
  void put(std::to_chars_result result) {
    // The scratch holds any number these write; a failure would be a bug.
    if (result.ec == std::errc{}) {
      buffer_.append(scratch_, result.ptr);
    }
  }

  std::FILE* file_;
  std::string buffer_;
  char scratch_[64];
  bool ok_ = true;
};

void writeTriple(TextWriter& out, const DemoVector& v) {
  out.exact(v[0]);
  out.text(" ");
  out.exact(v[1]);
  out.text(" ");
  out.exact(v[2]);
  out.endLine();
}

struct Closer {
  void operator()(std::FILE* file) const { std::fclose(file); }
};

void failWrite(Error* error, const std::filesystem::path& path, std::string_view reason) {
  setError(error, "cloudreel", 1, "cannot write " + path.string() + ": " + std::string(reason));
}

// Where a point falls in the camera's picture, in pixels from its centre with
// +y up; false when it is behind the camera or outside the picture.
bool project(const DemoCamera& camera, const DemoPoint& point, double& x, double& y) {
  const DemoVector d = subtract({point.x, point.y, point.z}, camera.centre);
  const double depth = dot(camera.rotation[2], d);
  if (depth > -1e-6) {
    return false;
  }
  x = -camera.focal * dot(camera.rotation[0], d) / depth;
  y = -camera.focal * dot(camera.rotation[1], d) / depth;
  return std::abs(x) < kPhotographWidth / 2.0 && std::abs(y) < kPhotographHeight / 2.0;
}

}  // namespace

DemoVector DemoCamera::translation() const {
  return {-dot(rotation[0], centre), -dot(rotation[1], centre), -dot(rotation[2], centre)};
}

DemoScene makeDemoScene(std::size_t pointCount) {
  DemoScene scene;
  const std::vector<Surface> surfaces = sceneSurfaces();
  double weight = 0.0;
  for (const Surface& surface : surfaces) {
    weight += surface.area * surface.density;
  }
  scene.points.reserve(pointCount);
  Random random(kSeed);
  double share = 0.0;
  for (std::size_t s = 0; s < surfaces.size(); ++s) {
    share += surfaces[s].area * surfaces[s].density / weight;
    // Cumulative rounding: the counts add up to exactly pointCount.
    const std::size_t until =
        s + 1 == surfaces.size()
            ? pointCount
            : std::min(pointCount, static_cast<std::size_t>(
                                       std::llround(share * static_cast<double>(pointCount))));
    while (scene.points.size() < until) {
      const Sample sample = surfaces[s].sample(random);
      const DemoVector p = toWorld(sample.position);
      const double noise = random.between(0.92, 1.08);
      scene.points.push_back({static_cast<float>(p[0]), static_cast<float>(p[1]),
                              static_cast<float>(p[2]), channel(sample.color.r, noise),
                              channel(sample.color.g, noise), channel(sample.color.b, noise)});
    }
  }

  // Sixteen cameras in a ring at head height and eight higher up, nearer,
  // looking down between them.
  for (int i = 0; i < 16; ++i) {
    const double a = 2 * pi * i / 16 + 0.1;
    const DemoVector eye{10.5 * std::sin(a), 1.5 + 0.5 * std::sin(3 * a), 10.5 * std::cos(a)};
    scene.cameras.push_back(cameraAt(eye, {0.0, 1.2, 0.0}));
  }
  for (int i = 0; i < 8; ++i) {
    const double a = 2 * pi * (i + 0.5) / 8;
    scene.cameras.push_back(cameraAt({6.5 * std::sin(a), 5.5, 6.5 * std::cos(a)}, {0.0, 0.4, 0.0}));
  }
  return scene;
}

bool writeBundleFile(const DemoScene& scene, const std::filesystem::path& path, Error* error) {
  AtomicFileReplacement replacement(path);
  const std::unique_ptr<std::FILE, Closer> file(
      std::fopen(replacement.temporaryPath().c_str(), "wb"));
  if (!file) {
    failWrite(error, path, std::generic_category().message(errno));
    return false;
  }
  TextWriter out(file.get());
  out.text("# Bundle file v0.3");
  out.endLine();
  out.integer(static_cast<long long>(scene.cameras.size()));
  out.text(" ");
  out.integer(static_cast<long long>(scene.points.size()));
  out.endLine();
  for (const DemoCamera& camera : scene.cameras) {
    out.exact(camera.focal);
    out.text(" 0 0");
    out.endLine();
    for (const DemoVector& row : camera.rotation) {
      writeTriple(out, row);
    }
    writeTriple(out, camera.translation());
  }
  std::vector<long long> keys(scene.cameras.size(), 0);
  const std::size_t cameraCount = scene.cameras.size();
  for (std::size_t i = 0; i < scene.points.size(); ++i) {
    const DemoPoint& point = scene.points[i];
    out.fixed(point.x, 4);
    out.text(" ");
    out.fixed(point.y, 4);
    out.text(" ");
    out.fixed(point.z, 4);
    out.endLine();
    out.integer(point.r);
    out.text(" ");
    out.integer(point.g);
    out.text(" ");
    out.integer(point.b);
    out.endLine();
    // Up to two views, from cameras taken in turn so every camera gets its
    // share of features.
    std::array<std::size_t, 2> seen{};
    std::array<std::array<double, 2>, 2> at{};
    std::size_t views = 0;
    for (std::size_t k = 0; k < cameraCount && views < 2; ++k) {
      const std::size_t c = (i + k) % cameraCount;
      if (project(scene.cameras[c], point, at[views][0], at[views][1])) {
        seen[views++] = c;
      }
    }
    out.integer(static_cast<long long>(views));
    for (std::size_t v = 0; v < views; ++v) {
      out.text(" ");
      out.integer(static_cast<long long>(seen[v]));
      out.text(" ");
      out.integer(keys[seen[v]]++);
      out.text(" ");
      out.fixed(at[v][0], 2);
      out.text(" ");
      out.fixed(at[v][1], 2);
    }
    out.endLine();
  }
  if (!out.flush() || std::fflush(file.get()) != 0) {
    failWrite(error, path, std::generic_category().message(errno));
    return false;
  }
  Error reason;
  if (!replacement.commit(&reason)) {
    failWrite(error, path, reason.message);
    return false;
  }
  return true;
}

std::filesystem::path photographName(std::size_t index) {
  char name[32];
  std::snprintf(name, sizeof name, "%04zu.jpg", index);
  return std::filesystem::path("images") / name;
}

std::string photographListText(std::size_t cameraCount) {
  std::string text;
  for (std::size_t i = 0; i < cameraCount; ++i) {
    text += photographName(i).generic_string();
    text += '\n';
  }
  return text;
}

double photographFieldOfView(double focal) {
  return 2.0 * std::atan(kPhotographHeight / (2.0 * focal)) * 180.0 / pi;
}

std::vector<std::uint8_t> encodePhotograph(std::span<const std::uint8_t> rgba, int width,
                                           int height) {
  std::vector<std::uint8_t> encoded;
  if (width <= 0 || height <= 0 ||
      rgba.size() != static_cast<std::size_t>(width) * static_cast<std::size_t>(height) * 4) {
    return encoded;
  }
  // The frame's colour is already weighted by its alpha (drawn over
  // transparent black), so the sky shows through by what alpha leaves.
  std::vector<std::uint8_t> rgb(static_cast<std::size_t>(width) * static_cast<std::size_t>(height) *
                                3);
  for (int y = 0; y < height; ++y) {
    const Rgb sky = mix({86, 134, 204}, {206, 224, 240}, static_cast<double>(y) / height);
    for (int x = 0; x < width; ++x) {
      const std::size_t i = static_cast<std::size_t>(y) * static_cast<std::size_t>(width) +
                            static_cast<std::size_t>(x);
      const double clear = (255 - rgba[i * 4 + 3]) / 255.0;
      rgb[i * 3 + 0] = channel(rgba[i * 4 + 0] + sky.r * clear, 1.0);
      rgb[i * 3 + 1] = channel(rgba[i * 4 + 1] + sky.g * clear, 1.0);
      rgb[i * 3 + 2] = channel(rgba[i * 4 + 2] + sky.b * clear, 1.0);
    }
  }
  const auto append = [](void* context, void* data, int size) {
    auto* bytes = static_cast<std::vector<std::uint8_t>*>(context);
    const auto* begin = static_cast<const std::uint8_t*>(data);
    bytes->insert(bytes->end(), begin, begin + size);
  };
  if (stbi_write_jpg_to_func(append, &encoded, width, height, 3, rgb.data(), 90) == 0) {
    encoded.clear();
  }
  return encoded;
}

DemoLandmarks demoLandmarks() {
  return {toWorld({3.2, 3.55, -3.4}),
          0.7,
          toWorld({kHouseX, 0.1, kHouseZ + kHouseDepth / 2 + 0.35}),
          {5.0, 10.0, 7.0},
          toWorld({0.0, -1.2, 0.0}),
          toWorld({8.6, 2.2, -1.5})};
}

std::vector<DemoPose> flightPoses(int frames) {
  frames = std::max(frames, 2);
  std::vector<DemoPose> poses;
  poses.reserve(static_cast<std::size_t>(frames));
  for (int i = 0; i < frames; ++i) {
    const double e = smoothstep(static_cast<double>(i) / (frames - 1));
    // From 150 degrees round the back, 24 units out and 10 up, to the
    // resting pose 14 units in front of the middle at eye height.
    const double angle = 2.6 * (1.0 - e);
    const double radius = 24.0 + (kSceneDistance - 24.0) * e;
    const DemoVector eye{radius * std::sin(angle), 10.0 + (kEyeHeight - 10.0) * e,
                         radius * std::cos(angle)};
    const DemoVector target{0.0, 0.2 + (kEyeHeight - 0.2) * e, 0.0};
    const std::array<DemoVector, 3> axes = lookAt(toWorld(eye), toWorld(target));
    poses.push_back({toWorld(eye), axes});
  }
  // Rounding leaves the arithmetic's last pose a hair off the resting one;
  // the flight must end exactly where the scene camera rests.
  poses.back() = {{0.0, 0.0, 0.0}, {{{1.0, 0.0, 0.0}, {0.0, 1.0, 0.0}, {0.0, 0.0, 1.0}}}};
  return poses;
}

}  // namespace cloudreel::cli
