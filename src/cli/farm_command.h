#pragma once
// `cloudreel farm DOC.reel --out DIR [render options] [--chunk N]
// [--partition P] [--time LIMIT] [--sbatch-arg ARG]... [--shared-root PATH]...
// [--cloudreel PATH] [--wait] [--dry-run]`: renders a document on a Slurm
// cluster. The frames are split into chunks, and one array job runs
// `cloudreel render --frames` on each chunk, writing into DIR.

#include <string>
#include <vector>

#include "cli/render_command.h"

namespace CLI {
class App;
}

namespace cloudreel::cli {

// Exit statuses besides the render command's (0, 1 for bad input, 2 for
// frames not written, which --wait answers when a task failed).
inline constexpr int kFarmExitSubmitFailed = 4;

struct FarmOptions {
  RenderCommandOptions render;
  int chunk = 10;
  std::string partition;
  std::string timeLimit;
  std::vector<std::string> sbatchArgs;
  std::vector<std::string> sharedRoots;
  // The program the tasks run; this one when empty.
  std::string program;
  bool wait = false;
  bool dryRun = false;
};

CLI::App* addFarmCommand(CLI::App& app, FarmOptions& options);
int runFarmCommand(const FarmOptions& options);

}  // namespace cloudreel::cli
