// `cloudreel render` run as a user runs it, on documents `cloudreel import`
// made: the frames it writes and what they show, progress for schedulers,
// resuming, bad input refused before any frame, unwritable frames named,
// and Ctrl-C finishing the frame in flight.

#include <gtest/gtest.h>
#include <signal.h>

#include <chrono>
#include <filesystem>
#include <nlohmann/json.hpp>
#include <set>
#include <sstream>
#include <thread>

#include "cli/scene_document.h"
#include "render/gl/image_file.h"
#include "support/cli_runner.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

using testing::cloudreel;
using testing::Outcome;
using testing::TempDir;
namespace fs = std::filesystem;

int drawnPixels(const fs::path& file) {
  const auto image = gl::readTiff(file);
  if (!image) {
    return -1;
  }
  int drawn = 0;
  for (int y = 0; y < image->height; ++y) {
    for (int x = 0; x < image->width; ++x) {
      drawn += image->sample(x, y, 0) != 0 ? 1 : 0;
    }
  }
  return drawn;
}

TEST(CliRender, RendersTheWholeTimelineOfAnImportedDocumentAndResumes) {
  const TempDir dir;
  testing::makeSceneDocument(dir);
  const Outcome run = cloudreel(
      dir, {"render", "scene.reel", "--out", "frames", "--size", "32x24", "--progress", "json"});
  ASSERT_EQ(run.status, 0) << run.err;
  // One second at 25 frames a second: frames 0 to 25.
  const auto written = testing::fileNamesIn(dir / "frames");
  ASSERT_EQ(written.size(), 26U);
  EXPECT_TRUE(written.contains("output_0000.tiff"));
  EXPECT_TRUE(written.contains("output_0025.tiff"));
  const auto frame = gl::readTiff(dir / "frames/output_0012.tiff");
  ASSERT_TRUE(frame);
  EXPECT_EQ(frame->width, 32);
  EXPECT_EQ(frame->height, 24);
  EXPECT_GT(drawnPixels(dir / "frames/output_0012.tiff"), 20);

  std::istringstream lines(run.out);
  std::string line;
  int objects = 0;
  while (std::getline(lines, line)) {
    const auto object = nlohmann::json::parse(line);
    EXPECT_EQ(object["frame"], objects);
    EXPECT_EQ(object["total"], 26);
    EXPECT_TRUE(object["written"].get<bool>());
    ++objects;
  }
  EXPECT_EQ(objects, 26);

  // A resumed render draws only what is missing.
  fs::remove(dir / "frames/output_0007.tiff");
  const auto before = fs::last_write_time(dir / "frames/output_0008.tiff");
  const Outcome resumed = cloudreel(dir, {"render", "scene.reel", "--out", "frames", "--size",
                                          "32x24", "--skip-existing", "--progress", "plain"});
  ASSERT_EQ(resumed.status, 0) << resumed.err;
  EXPECT_NE(resumed.err.find("Rendered 1 frame into"), std::string::npos) << resumed.err;
  EXPECT_TRUE(fs::exists(dir / "frames/output_0007.tiff"));
  EXPECT_EQ(fs::last_write_time(dir / "frames/output_0008.tiff"), before);
}

TEST(CliRender, RangesDepthStereoAndCameraPathsNameTheirFiles) {
  const TempDir dir;
  testing::makeSceneDocument(dir);
  Outcome run = cloudreel(dir, {"render", "scene.reel", "--out", "a", "--size", "32x24", "--frames",
                                "3-4", "--depth", "--pattern", "f%03d.tif"});
  ASSERT_EQ(run.status, 0) << run.err;
  EXPECT_EQ(testing::fileNamesIn(dir / "a"),
            (std::set<std::string>{"f003.tif", "f004.tif", "depth_f003.tif", "depth_f004.tif"}));
  const auto depth = gl::readTiff(dir / "a/depth_f003.tif");
  ASSERT_TRUE(depth);
  EXPECT_EQ(depth->bitsPerSample, 16);

  run = cloudreel(dir, {"render", "scene.reel", "--out", "b", "--size", "32x24", "--frames", "0-0",
                        "--stereo", "0.2", "--depth"});
  ASSERT_EQ(run.status, 0) << run.err;
  EXPECT_EQ(testing::fileNamesIn(dir / "b"),
            (std::set<std::string>{"L_output_0000.tiff", "R_output_0000.tiff"}));

  // The path's two frames by its name, then by its index.
  for (const char* path : {"path.txt", "0"}) {
    fs::remove_all(dir / "c");
    run = cloudreel(
        dir, {"render", "scene.reel", "--out", "c", "--camera-path", path, "--size", "16x16"});
    ASSERT_EQ(run.status, 0) << run.err;
    EXPECT_EQ(testing::fileNamesIn(dir / "c"),
              (std::set<std::string>{"output_0000.tiff", "output_0001.tiff"}));
    EXPECT_GT(drawnPixels(dir / "c/output_0001.tiff"), 0);
  }
}

TEST(CliRender, BadInputIsRefusedInOneLineBeforeAnyFrame) {
  const TempDir dir;
  testing::makeSceneDocument(dir);
  testing::writeFile(dir / "broken.reel", "not a document at all");
  testing::writeFile(dir / "a-file", "");
  const std::vector<std::pair<std::vector<std::string>, std::string>> cases = {
      {{"broken.reel", "--out", "out"}, "corrupt"},
      {{"missing.reel", "--out", "out"}, "missing.reel"},
      {{"scene.reel", "--out", "out", "--pattern", "frame_%s.tiff"}, "pattern"},
      {{"scene.reel", "--out", "out", "--pattern", "%d_%d.tiff"}, "pattern"},
      {{"scene.reel", "--out", "out", "--frames", "20-30"}, "outside the timeline (frames 0-25)"},
      {{"scene.reel", "--out", "out", "--frames", "5-2"}, "A-B"},
      {{"scene.reel", "--out", "out", "--marks"}, "mark-in"},
      {{"scene.reel", "--out", "out", "--camera-path", "nowhere"}, "No camera path"},
      {{"scene.reel", "--out", "out", "--camera-path", "1"}, "No camera path"},
      {{"scene.reel", "--out", "out", "--camera-path", "0", "--frames", "0-2"}, "camera path"},
      {{"scene.reel", "--out", "out", "--size", "huge"}, "720p"},
      {{"scene.reel", "--out", "out", "--size", "0x10"}, "WIDTHxHEIGHT"},
      {{"scene.reel", "--out", "a-file/out"}, "output folder"},
      {{"scene.reel", "--out", "out", "--rasterizer", "fast"}, "--rasterizer"},
  };
  for (const auto& [args, message] : cases) {
    std::vector<std::string> command{"render"};
    command.insert(command.end(), args.begin(), args.end());
    const Outcome run = cloudreel(dir, command);
    SCOPED_TRACE(args[0] + " " + args.back());
    EXPECT_EQ(run.status, 1);
    EXPECT_NE(run.err.find(message), std::string::npos) << run.err;
    EXPECT_EQ(std::count(run.err.begin(), run.err.end(), '\n'), 1) << run.err;
    EXPECT_FALSE(fs::exists(dir / "out"));
  }
}

std::string fileBytes(const fs::path& file) { return testing::readFile(file); }

TEST(CliRender, PointsDrawnOnTheCpuGiveTheSameFilesAsOpenGL) {
  // The demo's reconstruction, its cameras, ocean and card: points the CPU
  // draws between layers that OpenGL draws, mono with depth and in stereo.
  const TempDir dir;
  const Outcome made = cloudreel(dir, {"demo", "demo", "--no-render", "--points", "40000"});
  ASSERT_EQ(made.status, 0) << made.err;
  for (const std::vector<std::string>& extra :
       {std::vector<std::string>{"--depth"}, std::vector<std::string>{"--stereo", "0.4"}}) {
    for (const std::string rasterizer : {"gl", "cpu"}) {
      std::vector<std::string> command{"render",       "demo/demo.reel", "--out",  rasterizer,
                                       "--frames",     "10-12",          "--size", "240x160",
                                       "--rasterizer", rasterizer};
      command.insert(command.end(), extra.begin(), extra.end());
      const Outcome run = cloudreel(dir, command);
      ASSERT_EQ(run.status, 0) << run.err;
    }
    std::size_t files = 0;
    for (const auto& entry : fs::directory_iterator(dir / "gl")) {
      const fs::path name = entry.path().filename();
      SCOPED_TRACE(name.string());
      EXPECT_EQ(fileBytes(dir / "cpu" / name), fileBytes(entry.path()));
      ++files;
    }
    EXPECT_EQ(files, 6u);
    fs::remove_all(dir / "gl");
    fs::remove_all(dir / "cpu");
  }
}

TEST(CliRender, FramesThatCannotBeWrittenAreNamedAndTheExitSaysSo) {
  const TempDir dir;
  testing::makeSceneDocument(dir);
  // The pattern names a folder that is not there.
  const Outcome run = cloudreel(dir, {"render", "scene.reel", "--out", "out", "--size", "16x16",
                                      "--frames", "1-2", "--pattern", "missing/%d.tiff"});
  EXPECT_EQ(run.status, 2);
  EXPECT_NE(run.err.find("frame 1 was not written"), std::string::npos) << run.err;
  EXPECT_NE(run.err.find("frame 2 was not written"), std::string::npos) << run.err;
  EXPECT_NE(run.err.find("2 frames could not be written"), std::string::npos) << run.err;
}

TEST(CliRender, CtrlCFinishesTheFrameInFlightAndStops) {
  const TempDir dir;
  testing::makeSceneDocument(dir);
  std::vector<std::string> args{CLOUDREEL_BINARY, "render", "scene.reel", "--out", "out",
                                "--size",         "1080p",  "--progress", "plain"};
  std::vector<char*> argv;
  for (std::string& arg : args) {
    argv.push_back(arg.data());
  }
  argv.push_back(nullptr);
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addchdir_np(&actions, dir.path().c_str());
  posix_spawn_file_actions_addopen(&actions, 2, (dir / "err.txt").c_str(),
                                   O_WRONLY | O_CREAT | O_TRUNC, 0600);
  pid_t pid = 0;
  ASSERT_EQ(posix_spawn(&pid, argv[0], &actions, nullptr, argv.data(), environ), 0);
  posix_spawn_file_actions_destroy(&actions);
  // Interrupted once the first frame is on disk.
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
  while (!fs::exists(dir / "out/output_0000.tiff") && std::chrono::steady_clock::now() < deadline) {
    std::this_thread::sleep_for(std::chrono::milliseconds(5));
  }
  kill(pid, SIGINT);
  int status = 0;
  ASSERT_EQ(waitpid(pid, &status, 0), pid);
  ASSERT_TRUE(WIFEXITED(status));
  EXPECT_EQ(WEXITSTATUS(status), 130);
  // Every file there is a whole frame; the render did not run to its end.
  const auto written = testing::fileNamesIn(dir / "out");
  EXPECT_LT(written.size(), 26U);
  for (const std::string& name : written) {
    EXPECT_TRUE(gl::readTiff(dir / "out" / name)) << name;
  }
  EXPECT_NE(testing::readFile(dir / "err.txt").find("Stopped by Ctrl-C"), std::string::npos);
}

}  // namespace
}  // namespace cloudreel
