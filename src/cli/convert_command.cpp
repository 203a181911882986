#include "cli/convert_command.h"

#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <cstdio>
#include <filesystem>
#include <limits>

#include "cli/point_cloud_input.h"
#include "cli/standard_error_capture.h"
#include "scene/point_layer.h"

namespace cloudreel::cli {

CLI::App* addConvertCommand(CLI::App& app, ConvertOptions& options) {
  CLI::App* command = app.add_subcommand(
      "convert", "Import a .ply file and write its points as a .rwb point file.");
  command->add_option("IN", options.input, "the .ply file to read")->required();
  command->add_option("OUT", options.output, "the .rwb point file to write (replaced if present)")
      ->required();
  command
      ->add_option("--downsample", options.downsample,
                   "keep every N-th vertex (default 1: all of them)")
      ->check(CLI::Range(1, std::numeric_limits<std::int32_t>::max()));
  return command;
}

int runConvertCommand(const ConvertOptions& options) {
  const std::filesystem::path input = options.input;
  const std::filesystem::path output = options.output;
  if (pointFileKind(input) != PointFileKind::Ply) {
    reportFailure(fmt::format("{}: convert reads .ply files", input.string()));
    return 1;
  }
  if (pointFileKind(output) != PointFileKind::PointFile) {
    reportFailure(fmt::format("{}: convert writes .rwb point files", output.string()));
    return 1;
  }

  std::error_code ec;
  const std::filesystem::path folder = output.parent_path();
  if (!folder.empty() && !std::filesystem::is_directory(folder, ec)) {
    reportFailure(
        fmt::format("cannot write {}: there is no folder {}", output.string(), folder.string()));
    return 1;
  }

  Error error;
  std::shared_ptr<PointLayer> layer =
      openPointCloud(input, PointFileKind::Ply, options.downsample, &error);
  if (!layer) {
    reportFailure(error.message);
    return 1;
  }

  const std::int32_t points = layer->nPoints();
  if (static_cast<std::size_t>(points) * layer->recordSize() >= std::size_t{32} << 20) {
    std::fprintf(stderr, "Writing %d points to %s...\n", points, output.c_str());
    std::fflush(stderr);
  }
  {
    StandardErrorCapture capture;
    // PLYFile's own save writes nothing (a PLY is never rewritten), so the
    // point layer's writer is called by name. It writes beside the target
    // and renames, so a failure leaves no partial file.
    (void)layer->PointLayer::savePointsToURLError(output, &error);
    if (!error.message.empty()) {
      // The layer goes while the capture holds its teardown log line.
      layer.reset();
      (void)capture.release();
    }
  }
  if (!layer) {
    reportFailure(fmt::format("cannot write {}: {}", output.string(), error.message));
    return 1;
  }
  std::fprintf(stderr, "Wrote %d points to %s\n", points, output.c_str());
  return 0;
}

}  // namespace cloudreel::cli
