// The cloudreel command run as a user runs it: files written into a
// temporary folder, the built program started on them, its exit status,
// standard output and standard error examined.

#include <gtest/gtest.h>
#include <stb/stb_image_write.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <map>
#include <nlohmann/json.hpp>
#include <numbers>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "support/cli_runner.h"
#include "support/ply_text.h"
#include "support/temp_dir.h"

namespace {

using cloudreel::testing::cloudreel;
using cloudreel::testing::Outcome;
using cloudreel::testing::PlyElement;
using cloudreel::testing::plyText;
using cloudreel::testing::readFile;
using cloudreel::testing::TempDir;
using cloudreel::testing::writeFile;
namespace fs = std::filesystem;

nlohmann::json infoJson(const TempDir& dir, const std::string& file) {
  const Outcome run = cloudreel(dir, {"info", file, "--json"});
  EXPECT_EQ(run.status, 0) << run.err;
  return nlohmann::json::parse(run.out, nullptr, false);
}

// A cloud of n vertices, vertex i at (i, -i/2, i % 7) coloured (i, 2i, 3i)
// modulo 256, and two faces, in the given PLY format.
std::string plyCloud(int n, const std::string& format) {
  PlyElement vertex{"vertex", cloudreel::testing::kPlyXyzRgb, {}};
  for (int i = 0; i < n; ++i) {
    vertex.instances.push_back({double(i), -0.5 * i, double(i % 7), double(i % 256),
                                double(2 * i % 256), double(3 * i % 256)});
  }
  const PlyElement face{"face", {{"int", "vertex_indices", "uchar"}}, {{3, 0, 1, 2}, {3, 1, 2, 3}}};
  return plyText({vertex, face}, format);
}

// A point file: 88-byte header and box, records of 16 bytes (28 with
// normals) whose last byte is the luck, then the faces' indices.
std::string pointFile(const std::vector<std::uint8_t>& lucks, bool normals, std::uint32_t faces) {
  std::string bytes(88, '\0');
  const std::uint32_t count = static_cast<std::uint32_t>(lucks.size());
  std::memcpy(bytes.data(), "RWBP", 4);
  std::memcpy(bytes.data() + 12, &count, 4);
  std::memcpy(bytes.data() + 20, &faces, 4);
  bytes[24] = normals ? 1 : 0;
  const double box[6] = {-1, -2, -3, 4, 5, 6};
  std::memcpy(bytes.data() + 40, box, sizeof box);
  for (std::uint8_t luck : lucks) {
    bytes.append(normals ? 27 : 15, '\0').push_back(static_cast<char>(luck));
  }
  return bytes.append(faces * 12, '\0');
}

// A reconstruction of three cameras and 20 points. Each camera: focal k1
// k2, the rotation R by rows, the translation t. Point i lies at
// (i/2 - 3, i % 5 - 2, -(i % 3) / 4), seen by two cameras; the box is
// x -3 .. 6.5, y -2 .. 2, z -0.5 .. 0.
std::string bundleText() {
  std::ostringstream bundle;
  bundle << "# Bundle file v0.3\n3 20\n"
            "500 -0.01 0.002\n1 0 0\n0 1 0\n0 0 1\n0 0 -5\n"
            "800 0 0\n0.8 0 -0.6\n0 1 0\n0.6 0 0.8\n1 -2 3\n"
            "700 0.1 0\n0 -1 0\n1 0 0\n0 0 1\n0.5 0.25 -4\n";
  for (int i = 0; i < 20; ++i) {
    bundle << i * 0.5 - 3 << ' ' << i % 5 - 2 << ' ' << -(i % 3) * 0.25 << '\n'
           << i * 10 << ' ' << 255 - i << " 7\n2 0 " << i << " 1.5 -2.25 2 " << i << " 0.5 0.75\n";
  }
  return bundle.str();
}

TEST(CliInfo, DescribesPlyFilesInEveryFormatAsTheirImportedLayer) {
  TempDir dir;
  for (const std::string format : {"ascii", "binary_little_endian", "binary_big_endian"}) {
    SCOPED_TRACE(format);
    writeFile(dir / "cloud.ply", plyCloud(300, format));
    const nlohmann::json info = infoJson(dir, "cloud.ply");
    EXPECT_EQ(info["points"], 300);
    EXPECT_EQ(info["faces"], 0);  // the import reads vertices only
    EXPECT_EQ(info["hasNormals"], false);
    EXPECT_EQ(info["bbox"], nlohmann::json({0.0, -149.5, 0.0, 299.0, 0.0, 6.0}));
    // Luck numbers the records 0-255 over and over.
    const auto histogram = info["luckHistogram"].get<std::vector<int>>();
    ASSERT_EQ(histogram.size(), 256u);
    EXPECT_EQ(histogram[0], 2);
    EXPECT_EQ(histogram[43], 2);
    EXPECT_EQ(histogram[44], 1);
    EXPECT_EQ(std::count(histogram.begin(), histogram.end(), 2), 44);
    EXPECT_EQ(info["ply"]["format"], format);
    const nlohmann::json& elements = info["ply"]["elements"];
    ASSERT_EQ(elements.size(), 2u);
    EXPECT_EQ(elements[0]["name"], "vertex");
    EXPECT_EQ(elements[0]["count"], 300);
    EXPECT_EQ(elements[0]["properties"][5], nlohmann::json({{"name", "blue"}, {"type", "uchar"}}));
    EXPECT_EQ(elements[1]["name"], "face");
    EXPECT_EQ(elements[1]["count"], 2);
    EXPECT_EQ(elements[1]["properties"][0],
              nlohmann::json({{"name", "vertex_indices"}, {"type", "list uchar int"}}));
  }
  const Outcome text = cloudreel(dir, {"info", "cloud.ply"});
  EXPECT_EQ(text.status, 0);
  EXPECT_NE(text.out.find("cloud.ply: 300 points, 0 faces"), std::string::npos) << text.out;
  EXPECT_NE(text.out.find("property list uchar int vertex_indices"), std::string::npos);
}

// A file whose vertices have no blue value imports as white points, and
// info says so; red and green alone do not make a coloured file.
TEST(CliInfo, SaysWhenAPlyFileHasNoColour) {
  TempDir dir;
  const PlyElement plain{"vertex",
                         {{"float", "x"}, {"float", "y"}, {"float", "z"}, {"uchar", "red"}},
                         {{1, 2, 3, 9}, {4, 5, 6, 9}}};
  writeFile(dir / "plain.ply", plyText({plain}, "ascii"));
  writeFile(dir / "cloud.ply", plyCloud(2, "ascii"));
  for (const auto& [file, coloured] : {std::pair{"plain.ply", false}, {"cloud.ply", true}}) {
    SCOPED_TRACE(file);
    const nlohmann::json info = infoJson(dir, file);
    EXPECT_EQ(info["points"], 2);
    EXPECT_EQ(info["ply"]["hasColor"], coloured);
    const Outcome text = cloudreel(dir, {"info", file});
    EXPECT_EQ(text.out.find("no colour: points are white") == std::string::npos, coloured)
        << text.out;
  }
}

// Little-endian vertices are measured rather than imported; a file whose
// data ends inside them (the header counts a list by its length alone, so
// faces before the vertices can hide it) is refused with the reason the
// import gives, as for a big-endian file that is imported.
TEST(CliInfo, RefusesAPlyFileThatEndsInsideItsVertices) {
  TempDir dir;
  for (const std::string format : {"binary_little_endian", "binary_big_endian"}) {
    SCOPED_TRACE(format);
    PlyElement vertex{"vertex", cloudreel::testing::kPlyXyzRgb, {}};
    for (int i = 0; i < 10; ++i) vertex.instances.push_back({1, 2, 3, 4, 5, 6});
    const PlyElement face{"face", {{"int", "vertex_indices", "uchar"}}, {{3, 0, 1, 2}}};
    const std::string whole = plyText({face, vertex}, format);
    writeFile(dir / "cut.ply", whole.substr(0, whole.size() - 10));
    const Outcome run = cloudreel(dir, {"info", "cut.ply"});
    EXPECT_EQ(run.status, 1);
    EXPECT_EQ(run.out, "");
    EXPECT_EQ(run.err,
              "cloudreel: cannot read points from cut.ply: the file ends inside element 'vertex' "
              "(instance 9 of 10)\n");
  }
}

// Names are bytes: a file name or a PLY header name that is not UTF-8
// still gives valid JSON, each bad byte replaced.
TEST(CliInfo, WritesValidJsonForNamesThatAreNotUtf8) {
  TempDir dir;
  PlyElement vertex{"vertex", cloudreel::testing::kPlyXyzRgb, {{1, 2, 3, 4, 5, 6}}};
  vertex.properties.push_back({"float", "qu\xe9lit\xe9"});
  vertex.instances[0].push_back(0.5);
  const std::string name = "bad\xff.ply";
  writeFile(dir / name, plyText({vertex}, "ascii"));
  const nlohmann::json info = infoJson(dir, name);
  ASSERT_FALSE(info.is_discarded());
  EXPECT_EQ(info["file"], "bad\xef\xbf\xbd.ply");
  EXPECT_EQ(info["ply"]["elements"][0]["properties"][6]["name"], "qu\xef\xbf\xbdlit\xef\xbf\xbd");
}

// Point files of plain records are read back after a conversion below.
TEST(CliInfo, DescribesAPointFileWithNormalsAndFaces) {
  TempDir dir;
  writeFile(dir / "NORMALS.RWB", pointFile({1, 2, 2}, true, 1));
  const nlohmann::json info = infoJson(dir, "NORMALS.RWB");
  EXPECT_EQ(info["points"], 3);
  EXPECT_EQ(info["faces"], 1);
  EXPECT_EQ(info["hasNormals"], true);
  EXPECT_EQ(info["bbox"], nlohmann::json({-1.0, -2.0, -3.0, 4.0, 5.0, 6.0}));
  EXPECT_EQ(info["luckHistogram"][1], 1);
  EXPECT_EQ(info["luckHistogram"][2], 2);
  EXPECT_FALSE(info.contains("ply"));
  // Quiet by default: the core's diagnostics show only with --verbose.
  EXPECT_EQ(cloudreel(dir, {"info", "NORMALS.RWB"}).err, "");
  EXPECT_NE(cloudreel(dir, {"--verbose", "info", "NORMALS.RWB"}).err.find("deallocing point layer"),
            std::string::npos);
}

TEST(CliInfo, DescribesABundleFileWithItsCamerasAndTheirPhotographs) {
  TempDir dir;
  // Two photographs of different sizes; the third camera's is missing.
  const std::vector<std::uint8_t> grey(100 * 50, 128);
  fs::create_directories(dir / "scene/images");
  ASSERT_NE(stbi_write_jpg((dir / "scene/images/a.jpg").c_str(), 64, 48, 1, grey.data(), 90), 0);
  ASSERT_NE(stbi_write_jpg((dir / "scene/images/b.jpg").c_str(), 100, 50, 1, grey.data(), 90), 0);
  writeFile(dir / "scene/list.txt",
            "images/a.jpg 0 500\nimages/b.jpg 0 800\nimages/gone.jpg 0 700\n");
  writeFile(dir / "scene/bundle/bundle.out", bundleText());

  const nlohmann::json info = infoJson(dir, "scene/bundle/bundle.out");
  EXPECT_EQ(info["points"], 20);
  EXPECT_EQ(info["faces"], 0);
  EXPECT_EQ(info["hasNormals"], false);
  EXPECT_EQ(info["bbox"], nlohmann::json({-3.0, -2.0, -0.5, 6.5, 2.0, 0.0}));
  EXPECT_EQ(info["bundle"], nlohmann::json({{"cameras", 3}, {"points", 20}}));
  const struct {
    double focal, k1, k2;
    std::array<double, 3> centre;  // -Rᵀt
    int width, height;             // of the photograph; 0 without one
  } cameras[] = {{500, -0.01, 0.002, {0, 0, 5}, 64, 48},
                 {800, 0, 0, {-2.6, 2, -1.8}, 100, 50},
                 {700, 0.1, 0, {-0.25, 0.5, 4}, 0, 0}};
  ASSERT_EQ(info["cameras"].size(), 3u);
  for (int i = 0; i < 3; ++i) {
    SCOPED_TRACE(i);
    const auto& c = cameras[i];
    const nlohmann::json& camera = info["cameras"][std::size_t(i)];
    EXPECT_EQ(camera["index"], i);
    EXPECT_EQ(camera["focal"], c.focal);
    EXPECT_EQ(camera["k1"], c.k1);
    EXPECT_EQ(camera["k2"], c.k2);
    const auto centre = camera["centre"].get<std::vector<double>>();
    ASSERT_EQ(centre.size(), 3u);
    for (std::size_t axis = 0; axis < 3; ++axis) {
      EXPECT_NEAR(centre[axis], c.centre[axis], 1e-12) << axis;
    }
    const double fov = 2 * std::atan((c.width - 1) / (2 * c.focal)) * 180 / std::numbers::pi;
    EXPECT_NEAR(camera["fieldOfView"].get<double>(), fov, 1e-4);
    EXPECT_EQ(camera["image"], c.width == 0
                                   ? nlohmann::json(nullptr)
                                   : nlohmann::json({{"width", c.width}, {"height", c.height}}));
  }

  const Outcome text = cloudreel(dir, {"info", "scene/bundle/bundle.out"});
  EXPECT_EQ(text.status, 0);
  EXPECT_NE(text.out.find("bundle.out: 20 points"), std::string::npos) << text.out;
  EXPECT_NE(text.out.find("photograph 100x50\n"), std::string::npos) << text.out;
  EXPECT_NE(text.out.find("no photograph\n"), std::string::npos) << text.out;
}

TEST(CliConvert, WritesAPointFileThatOpensAsTheSameCloud) {
  TempDir dir;
  writeFile(dir / "scan.PLY", plyCloud(300, "binary_little_endian"));
  ASSERT_EQ(cloudreel(dir, {"convert", "scan.PLY", "scan.rwb"}).status, 0);
  const nlohmann::json source = infoJson(dir, "scan.PLY");
  const nlohmann::json converted = infoJson(dir, "scan.rwb");
  for (const char* key : {"points", "faces", "hasNormals", "bbox", "luckHistogram"}) {
    EXPECT_EQ(converted[key], source[key]) << key;
  }

  const Outcome halved = cloudreel(dir, {"convert", "scan.PLY", "half.rwb", "--downsample", "2"});
  ASSERT_EQ(halved.status, 0) << halved.err;
  EXPECT_EQ(halved.out, "");
  EXPECT_EQ(infoJson(dir, "half.rwb")["points"], 150);
}

TEST(CliCommands, RefuseBadInputWithOneLineNamingTheFileAndLeaveNoOutput) {
  TempDir dir;
  writeFile(dir / "cloud.ply", plyCloud(10, "ascii"));
  writeFile(dir / "garbage.ply", "this is not a point cloud\n");
  std::string badValue = plyCloud(10, "ascii");
  badValue.replace(badValue.find("\n4 -2 4 "), 8, "\n4 -2 x ");
  writeFile(dir / "bad-value.ply", badValue);
  const std::string points = pointFile({1, 2, 3, 4}, false, 0);
  writeFile(dir / "truncated.rwb", points.substr(0, points.size() - 20));
  writeFile(dir / "empty.out", "");
  writeFile(dir / "garbage.out", "this is not a reconstruction\n");
  const std::set<fs::path> before(fs::directory_iterator(dir.path()), fs::directory_iterator());

  // Every bad input goes to info (plain and --json), which says why after
  // the file's name, and to convert, which reads only .ply files and names
  // the input either way.
  std::vector<std::pair<std::vector<std::string>, std::string>> runs = {
      {{"convert", "cloud.ply", "out.txt"}, "out.txt"},
      {{"convert", "cloud.ply", "no-folder/out.rwb"}, "no-folder/out.rwb"}};
  for (const std::string named :
       {"missing.ply", "missing.rwb", "missing.out", "notes.txt", "garbage.ply", "bad-value.ply",
        "truncated.rwb: Cannot read points: short read", "empty.out: File corrupt: short read",
        "garbage.out: not a bundle file"}) {
    const std::string file = named.substr(0, named.find(':'));
    runs.push_back({{"info", file}, named});
    runs.push_back({{"info", file, "--json"}, named});
    runs.push_back({{"convert", file, "out.rwb"}, file});
  }
  for (const auto& [args, named] : runs) {
    SCOPED_TRACE(args[0] + " " + args[1] + (args.size() > 2 ? " " + args[2] : ""));
    const Outcome run = cloudreel(dir, args);
    EXPECT_NE(run.status, 0);
    EXPECT_EQ(run.out, "");
    EXPECT_EQ(std::count(run.err.begin(), run.err.end(), '\n'), 1) << run.err;
    EXPECT_EQ(run.err.rfind("cloudreel: ", 0), 0u) << run.err;
    EXPECT_NE(run.err.find(named), std::string::npos) << run.err;
  }
  const std::set<fs::path> after(fs::directory_iterator(dir.path()), fs::directory_iterator());
  EXPECT_EQ(after, before);
}

// Three frames of 4x4 matrices moving along x.
constexpr const char* kMatrixPath =
    "3\n"
    "1 0 0 0  0 1 0 0  0 0 1 10  0 0 0 1\n"
    "1 0 0 1  0 1 0 0  0 0 1 10  0 0 0 1\n"
    "1 0 0 2  0 1 0 0  0 0 1 10  0 0 0 1\n";

// The scene inputs every import test starts from: a PLY scan, a point file,
// a reconstruction and a camera path of each kind.
void writeSceneInputs(const TempDir& dir) {
  writeFile(dir / "cloud.ply", plyCloud(300, "binary_little_endian"));
  writeFile(dir / "points.rwb", pointFile(std::vector<std::uint8_t>(1000, 9), false, 0));
  writeFile(dir / "scene/bundle/bundle.out", bundleText());
  writeFile(dir / "path.txt", kMatrixPath);
  writeFile(dir / "zxy.txt", "2\n0 0 5 0 0 0\n1 0 5 0 90 0\n");
}

std::vector<std::string> strings(const nlohmann::json& list, const char* key) {
  std::vector<std::string> values;
  for (const nlohmann::json& item : list) {
    values.push_back(item[key].get<std::string>());
  }
  return values;
}

TEST(CliImport, MakesADocumentOfEveryKindOfInputThatInfoDescribes) {
  TempDir dir;
  writeSceneInputs(dir);
  const Outcome run =
      cloudreel(dir, {"import", "scene.reel", "cloud.ply", "points.rwb", "scene/bundle/bundle.out",
                      "--zxy-path", "zxy.txt", "--matrix-path", "path.txt", "--downsample", "2"});
  ASSERT_EQ(run.status, 0) << run.err;
  EXPECT_EQ(run.out, "");

  const nlohmann::json info = infoJson(dir, "scene.reel");
  const nlohmann::json& layers = info["layers"];
  EXPECT_EQ(strings(layers, "class"),
            (std::vector<std::string>{"PLYFile", "PointLayer", "BundlerFile", "DiscreteCameraPath",
                                      "ZXYCameraPath"}));
  EXPECT_EQ(
      strings(layers, "name"),
      (std::vector<std::string>{"cloud.ply", "points.rwb", "bundle.out", "path.txt", "zxy.txt"}));
  EXPECT_EQ(layers[0]["points"], 150);  // the downsampling applies to PLY files only
  EXPECT_EQ(layers[1]["points"], 1000);
  EXPECT_EQ(layers[1]["linked"], false);
  EXPECT_EQ(layers[2]["points"], 20);
  ASSERT_EQ(layers[2]["children"].size(), 1u);
  EXPECT_EQ(layers[2]["children"][0]["class"], "CameraField");
  EXPECT_EQ(layers[2]["children"][0]["cameras"], 3);
  EXPECT_EQ(layers[3]["frames"], 3);
  // The document's paths, as found in the layer tree: the bundle file's
  // cameras first, then the path files in their order of import.
  EXPECT_EQ(strings(info["cameraPaths"], "class"),
            (std::vector<std::string>{"CameraField", "DiscreteCameraPath", "ZXYCameraPath"}));
  EXPECT_EQ(info["cameraPaths"][0]["frames"], 3);
  EXPECT_EQ(info["cameraPaths"][2]["frames"], 2);
  EXPECT_EQ(info["timeline"]["fps"], 25);
  EXPECT_EQ(info["overrideBuckets"], true);

  // The new document's camera looks down -z at the union of the boxes
  // (x -3 .. 298, y -149 .. 5, z -3 .. 6) and sees its sphere whole,
  // between its near and far planes.
  const nlohmann::json& camera = info["sceneCamera"];
  const auto position = camera["position"].get<std::vector<double>>();
  ASSERT_EQ(position.size(), 3u);
  EXPECT_NEAR(position[0], 147.5, 1e-3);
  EXPECT_NEAR(position[1], -72, 1e-3);
  const double radius = std::hypot(301.0, 154.0, 9.0) / 2;
  const double distance = position[2] - 1.5;
  const double halfAngle = camera["fieldOfView"].get<double>() / 2 * std::numbers::pi / 180;
  EXPECT_GE(distance * std::sin(halfAngle), radius);
  EXPECT_GT(camera["zNear"].get<double>(), 0);
  EXPECT_LT(camera["zNear"].get<double>(), distance - radius);
  EXPECT_GT(camera["zFar"].get<double>(), distance + radius);

  const Outcome text = cloudreel(dir, {"info", "scene.reel"});
  EXPECT_EQ(text.status, 0);
  EXPECT_NE(text.out.find("\n  BundlerFile \"bundle.out\", 20 points\n"
                          "    CameraField \"Cameras\", 3 cameras\n"),
            std::string::npos)
      << text.out;

  // A second import appends and leaves the camera where the user has it.
  const Outcome again = cloudreel(dir, {"import", "scene.reel", "points.rwb"});
  ASSERT_EQ(again.status, 0) << again.err;
  const nlohmann::json appended = infoJson(dir, "scene.reel");
  EXPECT_EQ(appended["layers"].size(), 6u);
  EXPECT_EQ(appended["layers"][5]["class"], "PointLayer");
  EXPECT_EQ(appended["cameraPaths"], info["cameraPaths"]);
  EXPECT_EQ(appended["sceneCamera"], info["sceneCamera"]);
}

TEST(CliImport, AddsPictureCardsAndAnOceanThatInfoListsAndRenderShows) {
  TempDir dir;
  fs::create_directory(dir / "shots");
  // Three 8 × 4 pictures, numbers 1, 2 and 4: number 3 is missing.
  for (int n : {1, 2, 4}) {
    const std::vector<std::uint8_t> rgb(8 * 4 * 3, static_cast<std::uint8_t>(60 * n));
    const std::string name = "shots/shot_" + std::to_string(n) + ".png";
    ASSERT_NE(stbi_write_png((dir / name).c_str(), 8, 4, 3, rgb.data(), 8 * 3), 0);
  }
  const Outcome run = cloudreel(
      dir, {"import", "sea.reel", "--card", "shots/shot_%d.png", "--card", "shots", "--ocean"});
  ASSERT_EQ(run.status, 0) << run.err;

  const nlohmann::json info = infoJson(dir, "sea.reel");
  const nlohmann::json& layers = info["layers"];
  EXPECT_EQ(strings(layers, "class"),
            (std::vector<std::string>{"AnimatedCard", "AnimatedCard", "OceanFFT"}));
  EXPECT_EQ(layers[0]["frames"], 4);  // 1 to 4, the missing one keeps its place
  EXPECT_EQ(layers[0]["source"], (fs::canonical(dir.path()) / "shots/shot_%d.png").string());
  EXPECT_EQ(layers[1]["frames"], 3);  // a folder: the pictures it holds
  EXPECT_EQ(layers[1]["width"], 8);
  EXPECT_EQ(layers[2]["grid"], 128);
  // The ocean's time follows the timeline.
  EXPECT_EQ(info["timeline"]["tracks"].back()["class"], "TimelineTrack");
  const Outcome text = cloudreel(dir, {"info", "sea.reel"});
  EXPECT_NE(text.out.find("OceanFFT \"Ocean\", 128 × 128 grid over 50 units, wind 8 m/s"),
            std::string::npos)
      << text.out;
  EXPECT_NE(text.out.find("AnimatedCard \"shots\", 3 frames from "), std::string::npos)
      << text.out;

  // The waves move between two frames a second apart.
  ASSERT_EQ(cloudreel(dir, {"render", "sea.reel", "--out", "f", "--size", "96x72", "--frames",
                            "0-0", "--pattern", "a_%d.tif"})
                .status,
            0);
  ASSERT_EQ(cloudreel(dir, {"render", "sea.reel", "--out", "f", "--size", "96x72", "--frames",
                            "25-25", "--pattern", "b_%d.tif"})
                .status,
            0);
  EXPECT_NE(readFile(dir / "f/a_0.tif"), readFile(dir / "f/b_25.tif"));

  // A card source that names no picture is refused, naming it.
  const Outcome refused = cloudreel(dir, {"import", "none.reel", "--card", "nothing_%03d.png"});
  EXPECT_NE(refused.status, 0);
  EXPECT_NE(refused.err.find("nothing_%03d.png"), std::string::npos) << refused.err;
  EXPECT_FALSE(fs::exists(dir / "none.reel"));
}

TEST(CliImport, LinkedLayersAreReadFromTheirFilesAndAMissingOneIsNamed) {
  TempDir dir;
  writeSceneInputs(dir);
  ASSERT_EQ(cloudreel(dir, {"import", "inline.reel", "points.rwb"}).status, 0);
  const Outcome linked = cloudreel(dir, {"import", "linked.reel", "points.rwb", "--link"});
  ASSERT_EQ(linked.status, 0) << linked.err;
  // The 16,000 bytes of records stay in the point file.
  EXPECT_GT(fs::file_size(dir / "inline.reel"), 16000u);
  EXPECT_LT(fs::file_size(dir / "linked.reel"), 16000u);
  const nlohmann::json info = infoJson(dir, "linked.reel");
  EXPECT_EQ(info["layers"][0]["linked"], true);
  EXPECT_EQ(info["layers"][0]["points"], 1000);
  EXPECT_EQ(info["layers"][0]["file"], (fs::canonical(dir.path()) / "points.rwb").string());

  fs::rename(dir / "points.rwb", dir / "moved.rwb");
  for (const auto& args :
       {std::vector<std::string>{"info", "linked.reel"}, {"info", "linked.reel", "--json"}}) {
    const Outcome run = cloudreel(dir, args);
    EXPECT_NE(run.status, 0);
    EXPECT_EQ(run.out, "");
    EXPECT_EQ(std::count(run.err.begin(), run.err.end(), '\n'), 1) << run.err;
    EXPECT_EQ(run.err.rfind("cloudreel: linked.reel: ", 0), 0u) << run.err;
    EXPECT_NE(run.err.find("points.rwb"), std::string::npos) << run.err;
  }
  EXPECT_EQ(infoJson(dir, "inline.reel")["layers"][0]["points"], 1000);
}

TEST(CliImport, RefusesWithOneLineAndLeavesTheDocumentAsItWas) {
  TempDir dir;
  writeSceneInputs(dir);
  ASSERT_EQ(cloudreel(dir, {"import", "good.reel", "cloud.ply"}).status, 0);
  const std::string good = readFile(dir / "good.reel");
  writeFile(dir / "garbage.reel", "this is no document\n");
  writeFile(dir / "truncated.reel", good.substr(0, good.size() / 2));
  writeFile(dir / "garbage.ply", "this is not a point cloud\n");
  writeFile(dir / "garbage.out", "this is not a reconstruction\n");
  writeFile(dir / "notes.txt", "no camera path here\n");
  const std::string points = pointFile({1, 2, 3, 4}, false, 0);
  writeFile(dir / "truncated.rwb", points.substr(0, points.size() - 20));
  const std::set<fs::path> before(fs::directory_iterator(dir.path()), fs::directory_iterator());
  const std::map<fs::path, std::string> documents = {
      {"good.reel", good},
      {"garbage.reel", readFile(dir / "garbage.reel")},
      {"truncated.reel", readFile(dir / "truncated.reel")}};

  // Damaged documents are refused by info and import alike.
  std::vector<std::pair<std::vector<std::string>, std::string>> runs;
  for (const std::string document : {"garbage.reel", "truncated.reel"}) {
    const std::string said = "cloudreel: " + document + ": The document is corrupt\n";
    runs.push_back({{"info", document}, said});
    runs.push_back({{"info", document, "--json"}, said});
    runs.push_back({{"import", document, "cloud.ply"}, said});
  }
  // A file that cannot be imported is named, whether the document exists
  // or would be made.
  for (const auto& bad : {std::vector<std::string>{"missing.ply"},
                          {"garbage.ply"},
                          {"truncated.rwb"},
                          {"garbage.out"},
                          {"notes.txt"},
                          {"--matrix-path", "missing.txt"},
                          {"--matrix-path", "notes.txt"},
                          {"--zxy-path", "notes.txt"}}) {
    for (const std::string document : {"good.reel", "new.reel"}) {
      std::vector<std::string> args = {"import", document, "cloud.ply"};
      args.insert(args.end(), bad.begin(), bad.end());
      runs.push_back({args, bad.back()});
    }
  }
  runs.push_back({{"import", "new.txt", "cloud.ply"}, "new.txt"});
  for (const auto& [args, said] : runs) {
    SCOPED_TRACE(args[0] + " " + args[1] + " " + args.back());
    const Outcome run = cloudreel(dir, args);
    EXPECT_NE(run.status, 0);
    EXPECT_EQ(run.out, "");
    EXPECT_EQ(std::count(run.err.begin(), run.err.end(), '\n'), 1) << run.err;
    EXPECT_EQ(run.err.rfind("cloudreel: ", 0), 0u) << run.err;
    EXPECT_NE(run.err.find(said), std::string::npos) << run.err;
  }
  for (const auto& [document, bytes] : documents) {
    EXPECT_TRUE(readFile(dir / document) == bytes) << document << " changed";
  }
  const std::set<fs::path> after(fs::directory_iterator(dir.path()), fs::directory_iterator());
  EXPECT_EQ(after, before);
}

}  // namespace
