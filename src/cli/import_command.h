#pragma once
// `cloudreel import DOC.reel FILE... [--link] [--downsample N]
// [--matrix-path FILE]... [--zxy-path FILE]...`: adds a layer for each
// point file and camera path file to a document, making the document when
// it does not exist yet, and saves it.

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
  bool link = false;
  std::int32_t downsample = 1;
};

// Adds the subcommand, which fills `options` when parsed.
CLI::App* addImportCommand(CLI::App& app, ImportOptions& options);

// Answers the process's exit status.
int runImportCommand(const ImportOptions& options);

}  // namespace cloudreel::cli
