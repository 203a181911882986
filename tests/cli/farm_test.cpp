// `cloudreel farm` run as a user runs it: the batch script it would submit,
// what it refuses before submitting, and a real render through a one-node
// Slurm cluster started on this machine (scripts/local-slurm), whose frames
// must be byte for byte those of a local render.

#include <gtest/gtest.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <set>
#include <sstream>

#include "cli/scene_document.h"
#include "support/cli_runner.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

using testing::cloudreel;
using testing::Outcome;
using testing::TempDir;
namespace fs = std::filesystem;

// Sets an environment variable for the life of the object.
class ScopedEnv {
 public:
  ScopedEnv(const char* name, const std::string& value) : name_(name) {
    if (const char* old = std::getenv(name)) {
      previous_ = old;
    }
    setenv(name, value.c_str(), 1);
  }
  ~ScopedEnv() {
    if (previous_) {
      setenv(name_, previous_->c_str(), 1);
    } else {
      unsetenv(name_);
    }
  }
  ScopedEnv(const ScopedEnv&) = delete;
  ScopedEnv& operator=(const ScopedEnv&) = delete;

 private:
  const char* name_;
  std::optional<std::string> previous_;
};

TEST(CliFarm, ADryRunPrintsTheArrayJobAndSubmitsNothing) {
  const TempDir dir;
  testing::makeSceneDocument(dir);
  // clang-format off
  const Outcome run = cloudreel(
      dir, {"farm", "scene.reel", "--out", "frames", "--frames", "3-24", "--chunk", "10",
            "--partition", "gpu", "--time", "0:30:00", "--sbatch-arg=--gres=gpu:1", "--size",
            "PAL Square Pixel", "--depth", "--pattern", "shot %03d.tif", "--rasterizer", "cpu",
            "--dry-run"});
  // clang-format on
  ASSERT_EQ(run.status, 0) << run.err;
  for (const std::string& line : std::vector<std::string>{
           "#SBATCH --array=0-2\n", "#SBATCH --partition=gpu\n", "#SBATCH --time=0:30:00\n",
           "#SBATCH --gres=gpu:1\n", "chunks=(3-12 13-22 23-24)\n",
           " render " + (dir / "scene.reel").string() + " --out " + (dir / "frames").string(),
           "--frames \"${chunks[$SLURM_ARRAY_TASK_ID]}\" --skip-existing --size 'PAL Square Pixel' "
           "--depth --pattern 'shot %03d.tif' --rasterizer cpu",
           "#SBATCH --output=" + (dir / "frames/cloudreel-farm/%A_%a.log").string()}) {
    EXPECT_NE(run.out.find(line), std::string::npos) << line << "\nin\n" << run.out;
  }
  EXPECT_FALSE(fs::exists(dir / "frames"));
}

TEST(CliFarm, RefusesWhatTheNodesCouldNotReadAndAMissingSbatch) {
  const TempDir dir;
  testing::makeSceneDocument(dir);
  Outcome run = cloudreel(dir, {"farm", "scene.reel", "--out", "frames", "--shared-root",
                                (dir / "elsewhere").string(), "--dry-run"});
  EXPECT_EQ(run.status, 1);
  EXPECT_NE(run.err.find("the document " + (dir / "scene.reel").string() +
                         " is outside the shared folders"),
            std::string::npos)
      << run.err;
  run = cloudreel(dir, {"farm", "scene.reel", "--out", "/tmp/farm-frames", "--shared-root",
                        dir.path().string(), "--dry-run"});
  EXPECT_EQ(run.status, 1);
  EXPECT_NE(run.err.find("the output folder /tmp/farm-frames is outside"), std::string::npos)
      << run.err;
  run = cloudreel(dir, {"farm", "scene.reel", "--out", "frames", "--frames", "0-99"});
  EXPECT_EQ(run.status, 1);
  EXPECT_NE(run.err.find("outside the timeline"), std::string::npos) << run.err;
  {
    const ScopedEnv noSlurm("PATH", "/nonexistent");
    run = cloudreel(dir, {"farm", "scene.reel", "--out", "frames"});
  }
  EXPECT_EQ(run.status, 1);
  EXPECT_NE(run.err.find("sbatch not found"), std::string::npos) << run.err;
  EXPECT_FALSE(fs::exists(dir / "frames"));
}

std::string readBytes(const fs::path& path) { return testing::readFile(path); }

// The one-node cluster for the tests of this program, started once.
class LocalCluster : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    const fs::path script = fs::path(CLOUDREEL_SOURCE_DIR) / "scripts/local-slurm";
    state_ = new TempDir;
    // munged wants every folder above its socket open to all.
    fs::permissions(state_->path(), fs::perms::owner_all | fs::perms::group_read |
                                        fs::perms::group_exec | fs::perms::others_read |
                                        fs::perms::others_exec);
    const ScopedEnv where("CLOUDREEL_SLURM_DIR", (state_->path() / "slurm").string());
    const Outcome started = testing::runProgram(state_->path(), {script.string(), "start"});
    if (started.status != 0) {
      why_ = "the local Slurm cluster did not start (scripts/local-slurm start): " + started.err;
      return;
    }
    // What callers need to reach it, one "export NAME=value" a line.
    std::istringstream lines(testing::readFile(state_->path() / "slurm/env"));
    std::string line;
    while (std::getline(lines, line)) {
      const auto eq = line.find('=');
      if (line.rfind("export ", 0) == 0 && eq != std::string::npos) {
        setenv(line.substr(7, eq - 7).c_str(), line.substr(eq + 1).c_str(), 1);
      }
    }
    running_ = true;
  }
  static void TearDownTestSuite() {
    if (state_ != nullptr) {
      const ScopedEnv where("CLOUDREEL_SLURM_DIR", (state_->path() / "slurm").string());
      (void)testing::runProgram(
          state_->path(),
          {(fs::path(CLOUDREEL_SOURCE_DIR) / "scripts/local-slurm").string(), "stop"});
      delete state_;
      state_ = nullptr;
    }
  }
  void SetUp() override {
    if (!running_) {
      // In CI the cluster must run: a farm test that cannot reach it fails.
      const char* ci = std::getenv("CI");
      if (ci != nullptr && std::string(ci) == "true") {
        FAIL() << why_;
      }
      GTEST_SKIP() << why_;
    }
  }

  static inline TempDir* state_ = nullptr;
  static inline bool running_ = false;
  static inline std::string why_;
};

// One test, so the cluster starts once: the farm's frames against a local
// render's, a resubmission of the missing ones, and failing tasks.
TEST_F(LocalCluster, FramesRenderedOnTheClusterAreThoseOfALocalRender) {
  const TempDir dir;
  testing::makeSceneDocument(dir);
  using Clock = std::chrono::steady_clock;
  Clock::time_point start = Clock::now();
  Outcome run = cloudreel(dir, {"farm", "scene.reel", "--out", "farm", "--frames", "0-6", "--chunk",
                                "3", "--size", "64x48", "--depth", "--wait"});
  const double farmSeconds = std::chrono::duration<double>(Clock::now() - start).count();
  ASSERT_EQ(run.status, 0) << run.err;
  EXPECT_NE(run.err.find("7 frames in 3 tasks"), std::string::npos) << run.err;
  EXPECT_NE(run.err.find("ended: 7 of 7 frames"), std::string::npos) << run.err;

  start = Clock::now();
  run = cloudreel(dir, {"render", "scene.reel", "--out", "local", "--frames", "0-6", "--size",
                        "64x48", "--depth"});
  const double localSeconds = std::chrono::duration<double>(Clock::now() - start).count();
  ASSERT_EQ(run.status, 0) << run.err;
  std::printf("seven 64x48 frames with depth: %.2f s through the farm, %.2f s locally\n",
              farmSeconds, localSeconds);
  int compared = 0;
  for (const auto& entry : fs::directory_iterator(dir / "local")) {
    const fs::path name = entry.path().filename();
    EXPECT_EQ(readBytes(dir / "farm" / name), readBytes(entry.path())) << name;
    ++compared;
  }
  EXPECT_EQ(compared, 14);

  // Resubmitted with --skip-existing, only the missing frames go out.
  fs::remove(dir / "farm/output_0004.tiff");
  fs::remove(dir / "farm/depth_output_0005.tiff");
  run = cloudreel(dir, {"farm", "scene.reel", "--out", "farm", "--frames", "0-6", "--chunk", "3",
                        "--size", "64x48", "--depth", "--skip-existing", "--wait"});
  ASSERT_EQ(run.status, 0) << run.err;
  EXPECT_NE(run.err.find("2 frames in 1 task"), std::string::npos) << run.err;
  EXPECT_EQ(readBytes(dir / "farm/output_0004.tiff"), readBytes(dir / "local/output_0004.tiff"));

  // Tasks whose program fails at once are named with their frames.
  run = cloudreel(dir, {"farm", "scene.reel", "--out", "failing", "--frames", "0-3", "--chunk", "2",
                        "--size", "16x16", "--cloudreel", "/bin/false", "--wait"});
  EXPECT_EQ(run.status, 2);
  EXPECT_NE(run.err.find("task 0 (frames 0-1) failed with status 1"), std::string::npos) << run.err;
  EXPECT_NE(run.err.find("task 1 (frames 2-3) failed with status 1"), std::string::npos) << run.err;
}

}  // namespace
}  // namespace cloudreel
