#pragma once
// The built-in demo's synthetic reconstruction: a small coloured world (a
// checkered ground rising into low hills, a house, a colonnade, a beach ball
// and two trees) sampled as points, a ring of cameras photographing it, and
// the flight the demo's timeline takes over it. Everything is made from a
// fixed seed with our own generator, so a point count gives the same scene
// on every run and every machine.
//
// World coordinates have +y up and the ground at y = -1.6, centred 14 units
// in front of the origin along -z: the demo's scene camera rests at the
// origin, unturned, at a person's eye height looking at the middle of the
// scene, and the flight ends exactly there (see flightPoses).
//
// The cameras follow the bundle format's convention, which is also ours: a
// camera looks down its own -z with +y up, and its record holds R, whose
// rows are the camera's right, up and backward axes in world coordinates,
// and t = -R·C for the centre C.

#include <array>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <span>
#include <string>
#include <vector>

#include "platform/error.h"

namespace cloudreel::cli {

using DemoVector = std::array<double, 3>;

struct DemoPoint {
  float x, y, z;
  std::uint8_t r, g, b;
};

struct DemoCamera {
  // The focal length in pixels; no lens distortion.
  double focal = 0.0;
  // World to camera: rows right, up, backward.
  std::array<DemoVector, 3> rotation{};
  DemoVector centre{};

  // t = -R·C, as the bundle file stores it.
  DemoVector translation() const;
};

// A pose of the flight: where the camera is and its camera-to-world
// rotation as columns right, up, backward.
struct DemoPose {
  DemoVector position{};
  std::array<DemoVector, 3> axes{};
};

struct DemoScene {
  std::vector<DemoPoint> points;
  std::vector<DemoCamera> cameras;
};

// The photographs' size in pixels; every camera's focal length is for it.
inline constexpr int kPhotographWidth = 320;
inline constexpr int kPhotographHeight = 240;

// The scene of exactly `pointCount` points (at least one) and 24 cameras.
DemoScene makeDemoScene(std::size_t pointCount);

// The bundle file ("# Bundle v0.3", counts, the camera records, then per
// point its position, colour and view list) written atomically to `path`.
// A view list names up to two cameras whose picture the point falls in,
// each with a running key number and the point's position in that picture
// (pixels from its centre, +y up), as a reconstruction lists the features
// that placed the point. The error names the file.
[[nodiscard]] bool writeBundleFile(const DemoScene& scene, const std::filesystem::path& path,
                                   Error* error);

// Camera i's photograph, relative to the reconstruction's root.
std::filesystem::path photographName(std::size_t index);
// "list.txt": one photograph name a line, in camera order.
std::string photographListText(std::size_t cameraCount);

// The vertical field of view in degrees of a pinhole camera with this focal
// length over the photograph's height: drawn with it, a photograph is what
// the reconstruction's camera saw.
double photographFieldOfView(double focal);

// A rendered frame (RGBA, top row first, alpha 0 where nothing was drawn)
// as a JPEG photograph: what the frame left empty becomes sky. Empty when
// the image cannot be encoded.
std::vector<std::uint8_t> encodePhotograph(std::span<const std::uint8_t> rgba, int width,
                                           int height);

// Where the document's own objects go, in world coordinates: a gold ball
// (its diameter) resting on the colonnade's lintel, the marker before the
// house's front door, and the direction the light comes from.
struct DemoLandmarks {
  DemoVector ornament;
  double ornamentSize;
  DemoVector marker;
  DemoVector light;
  // The ocean's middle, below the ground's; where the photograph card
  // stands.
  DemoVector oceanCentre;
  DemoVector card;
};
DemoLandmarks demoLandmarks();

// `frames` poses (at least two) of a descending arc: from high above the
// back of the scene, round and down to the scene camera's resting pose
// (the origin, unturned), easing in and out so the last frames settle
// there.
std::vector<DemoPose> flightPoses(int frames);

}  // namespace cloudreel::cli
