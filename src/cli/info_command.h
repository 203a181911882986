#pragma once
// `cloudreel info FILE [--json]`: describes a ".reel" document, or the
// point layer a ".rwb", ".ply" or bundle ".out" file opens as, with a bundle
// file's cameras, as a short text or one JSON object on standard output.

#include <string>

namespace CLI {
class App;
}

namespace cloudreel::cli {

struct InfoOptions {
  std::string file;
  bool json = false;
};

// Adds the subcommand, which fills `options` when parsed.
CLI::App* addInfoCommand(CLI::App& app, InfoOptions& options);

// Answers the process's exit status.
int runInfoCommand(const InfoOptions& options);

}  // namespace cloudreel::cli
