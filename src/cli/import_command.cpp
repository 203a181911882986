#include "cli/import_command.h"

#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <limits>
#include <memory>
#include <optional>
#include <system_error>

#include "camera/camera_field.h"
#include "camera/camera_framing.h"
#include "camera/discrete_camera_path.h"
#include "camera/scene_camera.h"
#include "camera/zxy_camera_path.h"
#include "cli/document_input.h"
#include "cli/point_cloud_input.h"
#include "cli/point_cloud_summary.h"
#include "cli/standard_error_capture.h"
#include "platform/file_location.h"
#include "scene/animated_card.h"
#include "scene/my_document.h"
#include "scene/ocean_fft.h"
#include "scene/point_layer.h"
#include "timeline/timeline_editing.h"
#include "timeline/timeline_track.h"

namespace cloudreel::cli {

namespace {

void fail(Error* error, std::string message) {
  setError(error, "cloudreel", 1, std::move(message));
}

// A layer ready to be added, and whether it (or its first child, for a
// bundle file's cameras) also goes into the document's camera paths.
struct Imported {
  std::shared_ptr<Layer> layer;
  std::shared_ptr<CameraPath> cameraPath;
};

std::optional<Imported> importPointFile(const std::filesystem::path& path,
                                        const ImportOptions& options, Error* error) {
  const PointFileKind kind = pointFileKind(path);
  if (kind == PointFileKind::Bundler) {
    // The bundle reader takes any text for a reconstruction of nothing;
    // its counts line is what tells a bundle file.
    BundleHeaderDescription counts;
    if (!checkReadable(path, error) || !describeBundleHeader(path, &counts, error)) {
      return std::nullopt;
    }
  }
  const std::shared_ptr<PointLayer> layer =
      openPointCloud(path, kind, kind == PointFileKind::Ply ? options.downsample : 1, error);
  if (!layer) {
    return std::nullopt;
  }
  Imported imported{layer, nullptr};
  if (kind != PointFileKind::Ply) {
    // A PLY layer keeps its points in the document whatever is asked: it
    // never reads its file again. The others remember their file, and a
    // linked one is read from it each time the document is opened.
    layer->setOriginalURL(absolutePath(path));
    layer->setFileStoredAsLink(options.link);
  }
  // A layer marked modified and linked would have its file rewritten by
  // the save; a fresh import has changed nothing.
  layer->setIsModified(false);
  if (kind == PointFileKind::Bundler && !layer->childLayers().empty()) {
    imported.cameraPath = std::dynamic_pointer_cast<CameraField>(layer->childLayers().front());
  }
  return imported;
}

// PathClass: DiscreteCameraPath or ZXYCameraPath, each with its own reader.
template <typename PathClass>
std::optional<Imported> importCameraPath(const std::filesystem::path& path, Error* error) {
  // The path readers take a file they cannot open for an empty one, so
  // that is ruled out first to name the file.
  if (!checkReadable(path, error)) {
    return std::nullopt;
  }
  std::shared_ptr<PathClass> cameraPath;
  {
    StandardErrorCapture capture;
    cameraPath = PathClass::initWithURL(path);
    if (!cameraPath) {
      (void)capture.release();
      fail(error, fmt::format("cannot read a camera path from {}: out of memory", path.string()));
      return std::nullopt;
    }
  }
  // Text that is no path at all reads as a path of no frames: nothing a
  // user meant to import.
  if (cameraPath->nFrames() <= 0) {
    fail(error,
         fmt::format("cannot read a camera path from {}: it holds no frames", path.string()));
    return std::nullopt;
  }
  return Imported{cameraPath, cameraPath};
}

// A card of the picture, folder or pattern; a source that gives no
// picture is refused with the reason.
std::optional<Imported> importCard(const std::string& source, Error* error) {
  auto card = std::make_shared<AnimatedCard>();
  // Relative to where the command runs, as the other files are.
  card->setImagePath(absolutePath(source).string());
  if (!card->hasImages()) {
    fail(error, card->sourceError());
    return std::nullopt;
  }
  card->setName(std::filesystem::path(source).stem().string());
  return Imported{card, nullptr};
}

// The union of the layers' boxes. A box counts when its numbers are finite,
// each minimum at most its maximum, and it has some extent: layers that
// have no box (camera paths) keep the all-zero one they were made with.
std::optional<Layer::BoundingBox> unionOfBoxes(const std::vector<Imported>& layers) {
  std::optional<Layer::BoundingBox> total;
  for (const Imported& imported : layers) {
    addBoxToUnion(total, imported.layer->bbox());
  }
  return total;
}

}  // namespace

CLI::App* addImportCommand(CLI::App& app, ImportOptions& options) {
  CLI::App* command = app.add_subcommand(
      "import",
      "Add point files and camera paths to a document as layers, making the document "
      "if it does not exist.");
  command->add_option("DOC", options.document, "the .reel document to add to (made if missing)")
      ->required();
  command->add_option("FILE", options.files,
                      "a .rwb point file, a .ply file or a Bundler .out file");
  command->add_flag("--link", options.link,
                    "keep .rwb and .out layers linked to their files, read again each time the "
                    "document is opened, instead of storing their points in the document");
  command
      ->add_option("--downsample", options.downsample,
                   "keep every N-th vertex of .ply files (default 1: all of them)")
      ->check(CLI::Range(1, std::numeric_limits<std::int32_t>::max()));
  command->add_option("--matrix-path", options.matrixPaths,
                      "a camera path file of 4x4 matrices (a frame count, then sixteen numbers "
                      "a frame, row by row)");
  command->add_option("--zxy-path", options.zxyPaths,
                      "a camera path file of positions and angles (a frame count, then x y z "
                      "and three angles in degrees a frame)");
  command->add_option("--card", options.cards,
                      "a picture card: a picture file, a folder of numbered pictures, or a "
                      "printf-style pattern such as shots/frame_%04d.png");
  command->add_flag("--ocean", options.ocean,
                    "add an ocean surface whose waves move with the timeline");
  command->footer(
      "Layers are added in the order: the FILEs, then the --matrix-path files, then the "
      "--zxy-path files, the --card pictures and the ocean. A bundle file's layer holds its "
      "cameras as a child, which also joins "
      "the document's camera paths, as does every camera path file. A new document's scene "
      "camera is placed to see the imported points whole; an existing document keeps its "
      "camera. When any file cannot be imported nothing is saved.");
  return command;
}

int runImportCommand(const ImportOptions& options) {
  const std::filesystem::path documentPath = options.document;
  if (!isDocumentFile(documentPath)) {
    reportFailure(fmt::format("{}: import writes .reel documents", documentPath.string()));
    return 1;
  }
  if (options.files.empty() && options.matrixPaths.empty() && options.zxyPaths.empty() &&
      options.cards.empty() && !options.ocean) {
    reportFailure("import: nothing to import (name point files, camera paths, cards or --ocean)");
    return 1;
  }
  prepareForDocuments();

  MyDocument document;
  std::error_code ec;
  const bool exists = std::filesystem::exists(std::filesystem::symlink_status(documentPath, ec));
  Error error;
  if (exists) {
    if (!readDocument(document, documentPath, &error)) {
      reportFailure(error.message);
      return 1;
    }
  } else {
    const std::filesystem::path folder = documentPath.parent_path();
    if (!folder.empty() && !std::filesystem::is_directory(folder, ec)) {
      reportFailure(fmt::format("cannot write {}: there is no folder {}", documentPath.string(),
                                folder.string()));
      return 1;
    }
  }

  // Everything is read before the document changes, so a file that fails
  // leaves nothing half added and nothing saved.
  std::vector<Imported> imported;
  std::optional<Imported> next;
  for (const std::string& file : options.files) {
    if (!(next = importPointFile(file, options, &error))) {
      reportFailure(error.message);
      return 1;
    }
    imported.push_back(std::move(*next));
  }
  for (const std::string& file : options.matrixPaths) {
    if (!(next = importCameraPath<DiscreteCameraPath>(file, &error))) {
      reportFailure(error.message);
      return 1;
    }
    imported.push_back(std::move(*next));
  }
  for (const std::string& file : options.zxyPaths) {
    if (!(next = importCameraPath<ZXYCameraPath>(file, &error))) {
      reportFailure(error.message);
      return 1;
    }
    imported.push_back(std::move(*next));
  }

  for (const std::string& source : options.cards) {
    if (!(next = importCard(source, &error))) {
      reportFailure(error.message);
      return 1;
    }
    imported.push_back(std::move(*next));
  }
  std::shared_ptr<OceanFFT> ocean;
  if (options.ocean) {
    ocean = std::make_shared<OceanFFT>();
    imported.push_back({ocean, nullptr});
  }

  if (!exists && document.sceneCamera()) {
    if (const auto box = unionOfBoxes(imported)) {
      frameBoxWithCamera(*document.sceneCamera(), *box);
    }
  }
  for (Imported& item : imported) {
    document.addLayer(item.layer);
    if (item.cameraPath) {
      document.addCameraPath(item.cameraPath);
    }
  }
  if (ocean) {
    // Its waves follow the timeline, as in the application.
    addTrackToDocument(document, std::make_shared<TimelineTrack>(ocean, "frame", "Time"));
  }
  if (!writeDocument(document, documentPath, &error)) {
    reportFailure(error.message);
    return 1;
  }
  std::fprintf(stderr, "Added %zu layer%s to %s\n", imported.size(),
               imported.size() == 1 ? "" : "s", documentPath.c_str());
  return 0;
}

}  // namespace cloudreel::cli
