// `cloudreel demo` run as a newcomer runs it, with a small point count: the
// reconstruction it writes read back by an independent reading of the
// bundle file and by `cloudreel info`, its photographs decoded, its document
// described, its frames rendered, and the failures that must leave nothing.

#include <gtest/gtest.h>
#include <stb/stb_image.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <vector>

#include "render/gl/image_file.h"
#include "support/cli_runner.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

using testing::cloudreel;
using testing::Outcome;
using testing::readFile;
using testing::TempDir;
namespace fs = std::filesystem;

using Vec = std::array<double, 3>;

double dot(const Vec& a, const Vec& b) { return a[0] * b[0] + a[1] * b[1] + a[2] * b[2]; }

// The cameras of a bundle file as the format defines them.
struct BundleCamera {
  double focal;
  std::array<Vec, 3> r;
  Vec t;
  // C = -Rᵀt.
  Vec centre() const {
    Vec c{};
    for (std::size_t i = 0; i < 3; ++i) {
      c[i] = -(r[0][i] * t[0] + r[1][i] * t[1] + r[2][i] * t[2]);
    }
    return c;
  }
};

std::vector<BundleCamera> readBundleCameras(const std::string& text, long& points) {
  std::istringstream in(text);
  std::string comment;
  std::getline(in, comment);
  long count = 0;
  in >> count >> points;
  std::vector<BundleCamera> cameras(static_cast<std::size_t>(std::max(count, 0L)));
  for (BundleCamera& c : cameras) {
    double k1 = 0, k2 = 0;
    in >> c.focal >> k1 >> k2;
    for (Vec& row : c.r) {
      in >> row[0] >> row[1] >> row[2];
    }
    in >> c.t[0] >> c.t[1] >> c.t[2];
  }
  return in ? cameras : std::vector<BundleCamera>{};
}

nlohmann::json infoJson(const TempDir& dir, const std::string& file) {
  const Outcome run = cloudreel(dir, {"info", file, "--json"});
  EXPECT_EQ(run.status, 0) << run.err;
  return nlohmann::json::parse(run.out, nullptr, false);
}

struct Photograph {
  int width = 0, height = 0;
  std::vector<std::uint8_t> rgb;
};

Photograph decode(const fs::path& file) {
  Photograph photo;
  int channels = 0;
  const std::unique_ptr<stbi_uc, void (*)(void*)> pixels(
      stbi_load(file.c_str(), &photo.width, &photo.height, &channels, 3), stbi_image_free);
  if (pixels) {
    photo.rgb.assign(pixels.get(), pixels.get() + photo.width * photo.height * 3);
  }
  return photo;
}

// The share of pixels that differ clearly from the first pixel of their
// row: an empty picture, all sky, changes only from row to row.
double detail(const Photograph& photo) {
  int differing = 0;
  for (int y = 0; y < photo.height; ++y) {
    const std::uint8_t* row = &photo.rgb[static_cast<std::size_t>(y * photo.width * 3)];
    for (int x = 0; x < photo.width; ++x) {
      int d = 0;
      for (int c = 0; c < 3; ++c) {
        d = std::max(d, std::abs(row[x * 3 + c] - row[c]));
      }
      differing += d > 40 ? 1 : 0;
    }
  }
  return static_cast<double>(differing) / (photo.width * photo.height);
}

TEST(CliDemo, MakesAReconstructionWhoseCamerasPhotographTheScene) {
  const TempDir dir;
  const Outcome run = cloudreel(dir, {"demo", "demo", "--no-render", "--points", "20000"});
  ASSERT_EQ(run.status, 0) << run.err;
  for (const char* step : {"scene: 20000 points, 24 cameras (",
                           "bundle: ", "import: ", "photographs: 24 of 320x240 in ",
                           "document: ", "frames: not rendered"}) {
    EXPECT_NE(run.out.find(step), std::string::npos) << step << "\n" << run.out;
  }

  long points = 0;
  const std::vector<BundleCamera> cameras =
      readBundleCameras(readFile(dir / "demo/bundle/bundle.out"), points);
  EXPECT_EQ(points, 20000);
  ASSERT_EQ(cameras.size(), 24u);
  const nlohmann::json info = infoJson(dir, "demo/bundle/bundle.out");
  EXPECT_EQ(info["points"], 20000);
  const auto& box = info["bbox"];
  const Vec middle{(box[0].get<double>() + box[3].get<double>()) / 2,
                   (box[1].get<double>() + box[4].get<double>()) / 2,
                   (box[2].get<double>() + box[5].get<double>()) / 2};
  ASSERT_EQ(info["cameras"].size(), 24u);
  std::string list;
  for (std::size_t i = 0; i < cameras.size(); ++i) {
    SCOPED_TRACE(i);
    const BundleCamera& camera = cameras[i];
    // A rotation: orthonormal rows, right-handed.
    for (std::size_t a = 0; a < 3; ++a) {
      for (std::size_t b = 0; b < 3; ++b) {
        EXPECT_NEAR(dot(camera.r[a], camera.r[b]), a == b ? 1.0 : 0.0, 1e-9);
      }
    }
    const Vec& x = camera.r[0];
    const Vec& y = camera.r[1];
    EXPECT_NEAR(
        dot({x[1] * y[2] - x[2] * y[1], x[2] * y[0] - x[0] * y[2], x[0] * y[1] - x[1] * y[0]},
            camera.r[2]),
        1.0, 1e-9);
    // Looking at the middle of the scene: it is in front of the camera and
    // inside its picture.
    const Vec c = camera.centre();
    const Vec d{middle[0] - c[0], middle[1] - c[1], middle[2] - c[2]};
    const double depth = dot(camera.r[2], d);
    ASSERT_LT(depth, 0.0);
    EXPECT_LT(std::abs(camera.focal * dot(camera.r[0], d) / depth), 160.0);
    EXPECT_LT(std::abs(camera.focal * dot(camera.r[1], d) / depth), 120.0);
    // The reader places the camera where the file says, with its photograph.
    const auto read = info["cameras"][i];
    for (std::size_t axis = 0; axis < 3; ++axis) {
      EXPECT_NEAR(read["centre"][axis].get<double>(), c[axis], 1e-9);
    }
    EXPECT_EQ(read["image"], nlohmann::json({{"width", 320}, {"height", 240}}));

    char name[32];
    std::snprintf(name, sizeof name, "images/%04zu.jpg", i);
    list += std::string(name) + "\n";
    const Photograph photo = decode(dir / "demo" / name);
    ASSERT_EQ(photo.width, 320);
    ASSERT_EQ(photo.height, 240);
    EXPECT_GT(detail(photo), 0.15);
  }
  EXPECT_EQ(readFile(dir / "demo/list.txt"), list);
  // Each camera photographs its own view.
  const Photograph first = decode(dir / "demo/images/0000.jpg");
  const Photograph other = decode(dir / "demo/images/0012.jpg");
  double difference = 0;
  for (std::size_t i = 0; i < first.rgb.size(); ++i) {
    difference += std::abs(first.rgb[i] - other.rgb[i]);
  }
  EXPECT_GT(difference / static_cast<double>(first.rgb.size()), 20.0);

  // The same count makes the same reconstruction.
  ASSERT_EQ(cloudreel(dir, {"demo", "again", "--no-render", "--points", "20000"}).status, 0);
  EXPECT_EQ(readFile(dir / "again/bundle/bundle.out"), readFile(dir / "demo/bundle/bundle.out"));
}

TEST(CliDemo, MakesADocumentThatAnimatesTheReconstruction) {
  const TempDir dir;
  const Outcome run = cloudreel(dir, {"demo", "demo", "--no-render", "--points", "5000"});
  ASSERT_EQ(run.status, 0) << run.err;
  const nlohmann::json info = infoJson(dir, "demo/demo.reel");
  ASSERT_EQ(info["layers"].size(), 6u) << info.dump(2);

  // The reconstruction, read again from its file on opening.
  const auto& bundle = info["layers"][0];
  EXPECT_EQ(bundle["class"], "BundlerFile");
  EXPECT_EQ(bundle["points"], 5000);
  EXPECT_EQ(bundle["linked"], true);
  EXPECT_EQ(fs::path(bundle["file"].get<std::string>()),
            fs::canonical(dir / "demo/bundle/bundle.out"));
  ASSERT_EQ(bundle["children"].size(), 1u);
  EXPECT_EQ(bundle["children"][0]["class"], "CameraField");
  EXPECT_EQ(bundle["children"][0]["cameras"], 24);
  EXPECT_EQ(info["layers"][1]["class"], "DiscreteCameraPath");
  EXPECT_EQ(info["layers"][2]["class"], "Sphere");
  EXPECT_EQ(info["layers"][3]["class"], "Point3D");
  // An ocean below the scene, and a card showing the first photograph.
  EXPECT_EQ(info["layers"][4]["class"], "OceanFFT");
  EXPECT_EQ(info["layers"][4]["grid"], 128);
  const auto& card = info["layers"][5];
  EXPECT_EQ(card["class"], "AnimatedCard");
  EXPECT_EQ(fs::path(card["source"].get<std::string>()).parent_path(),
            fs::canonical(dir / "demo/images"));
  EXPECT_EQ(card["frames"], 1);
  EXPECT_EQ(card["width"], 320);
  std::vector<std::string> paths;
  for (const auto& path : info["cameraPaths"]) {
    paths.push_back(path["class"].get<std::string>() + " " + path["name"].get<std::string>());
  }
  EXPECT_EQ(paths, (std::vector<std::string>{"CameraField Cameras", "DiscreteCameraPath Flight"}));

  // The flight and the two ramps (point size and bucket limit; a track's
  // title is not stored), each a span between two control points, and the
  // ocean's time over the flight.
  const auto& timeline = info["timeline"];
  EXPECT_EQ(timeline["fps"], 25);
  EXPECT_EQ(timeline["lengthFrames"], 60);
  std::vector<std::string> tracks;
  for (const auto& track : timeline["tracks"]) {
    tracks.push_back(track["class"].get<std::string>() + " " +
                     std::to_string(track["clips"].get<int>()));
  }
  EXPECT_EQ(tracks, (std::vector<std::string>{"TimecodeTrack 0", "AffineTrack 3",
                                              "FloatValueTrack 3", "FloatValueTrack 3",
                                              "TimelineTrack 1"}));
  // The flight ends where the scene camera rests.
  EXPECT_EQ(info["sceneCamera"]["position"], nlohmann::json({0.0, 0.0, 0.0}));
}

TEST(CliDemo, RendersItsTimelineIntoFrames) {
  const TempDir dir;
  const Outcome run = cloudreel(dir, {"demo", "demo", "--points", "20000", "--size", "64x48"});
  ASSERT_EQ(run.status, 0) << run.err;
  EXPECT_NE(run.out.find("frames: 61 at 64x48 in "), std::string::npos) << run.out;
  std::size_t frames = 0;
  for ([[maybe_unused]] const auto& entry : fs::directory_iterator(dir / "demo/frames")) {
    ++frames;
  }
  EXPECT_EQ(frames, 61u);
  // The camera flies: the first and last frames show different pictures.
  const auto first = gl::readTiff(dir / "demo/frames/output_0000.tiff");
  const auto last = gl::readTiff(dir / "demo/frames/output_0060.tiff");
  ASSERT_TRUE(first && last);
  EXPECT_EQ(first->width, 64);
  EXPECT_EQ(first->height, 48);
  int differing = 0;
  for (std::size_t i = 0; i < first->samples.size(); ++i) {
    differing += first->samples[i] != last->samples[i] ? 1 : 0;
  }
  EXPECT_GT(differing, static_cast<int>(first->samples.size() / 4));
}

TEST(CliDemo, RefusesWithOneLineAndLeavesNothingBehind) {
  const TempDir dir;
  testing::writeFile(dir / "file", "not a folder");
  const struct {
    std::vector<std::string> args;
    std::string says;
  } cases[] = {
      {{"demo", "file/demo", "--points", "1000"}, "cloudreel: cannot make the folder file/demo: "},
      {{"demo", "made", "--size", "huge"}, "cloudreel: demo: Unknown size \"huge\""},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.args[1]);
    const Outcome run = cloudreel(dir, c.args);
    EXPECT_EQ(run.status, 1);
    EXPECT_EQ(run.err.rfind(c.says, 0), 0u) << run.err;
    EXPECT_EQ(std::count(run.err.begin(), run.err.end(), '\n'), 1) << run.err;
    EXPECT_EQ(run.out, "");
  }
  EXPECT_EQ(readFile(dir / "file"), "not a folder");
  EXPECT_FALSE(fs::exists(dir / "made"));

  // A step that fails takes back what the steps before it made, and only
  // that: here the list cannot replace a folder of its name.
  fs::create_directories(dir / "blocked/list.txt");
  const Outcome blocked = cloudreel(dir, {"demo", "blocked", "--points", "1000"});
  EXPECT_EQ(blocked.status, 1);
  EXPECT_NE(blocked.err.find("blocked/list.txt"), std::string::npos) << blocked.err;
  EXPECT_EQ(std::count(blocked.err.begin(), blocked.err.end(), '\n'), 1) << blocked.err;
  std::vector<fs::path> left;
  for (const auto& entry : fs::recursive_directory_iterator(dir / "blocked")) {
    left.push_back(entry.path());
  }
  EXPECT_EQ(left, std::vector<fs::path>{dir / "blocked/list.txt"});
}

}  // namespace
}  // namespace cloudreel
