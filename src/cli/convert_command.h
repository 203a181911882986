#pragma once
// `cloudreel convert IN.ply OUT.rwb [--downsample N]`: imports a PLY file
// as a point layer and writes its points as a point file.

#include <cstdint>
#include <string>

namespace CLI {
class App;
}

namespace cloudreel::cli {

struct ConvertOptions {
  std::string input;
  std::string output;
  std::int32_t downsample = 1;
};

// Adds the subcommand, which fills `options` when parsed.
CLI::App* addConvertCommand(CLI::App& app, ConvertOptions& options);

// Answers the process's exit status.
int runConvertCommand(const ConvertOptions& options);

}  // namespace cloudreel::cli
