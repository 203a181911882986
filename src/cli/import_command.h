#pragma once
// `cloudreel import DOC.reel FILE... [--link] [--downsample N]
// [--matrix-path FILE]... [--zxy-path FILE]... [--card PATH_OR_PATTERN]...
// [--ocean]`: adds a layer for each point file, camera path file and
// picture card, and an ocean, to a document, making the document when it
// does not exist yet, and saves it.

#include <cstdint>
#include <string>
#include <vector>

namespace CLI {
class App;
}

namespace cloudreel::cli {

struct ImportOptions {
  std::string document;
  std::vector<std::string> files;
  std::vector<std::string> matrixPaths;
  std::vector<std::string> zxyPaths;
  std::vector<std::string> cards;
  bool ocean = false;
  bool link = false;
  std::int32_t downsample = 1;
};

// Adds the subcommand, which fills `options` when parsed.
CLI::App* addImportCommand(CLI::App& app, ImportOptions& options);

// Answers the process's exit status.
int runImportCommand(const ImportOptions& options);

}  // namespace cloudreel::cli
