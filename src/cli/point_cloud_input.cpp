#include "cli/point_cloud_input.h"

#include <fmt/format.h>

#include <cctype>
#include <cerrno>
#include <cstdio>
#include <string>
#include <system_error>

#include "cli/standard_error_capture.h"
#include "import/bundler_file.h"
#include "import/ply_file.h"
#include "platform/file_location.h"
#include "scene/point_layer.h"

namespace cloudreel::cli {

namespace {

// Files from this size on take long enough to read that a stage line tells
// the user something is happening; below it, it would only clutter.
constexpr std::uintmax_t kLargeFileBytes = 32u << 20;

void fail(Error* error, std::string message) {
  setError(error, "cloudreel", 1, std::move(message));
}

// The PLY reader's own account of a failure, from what was printed while
// the layer was made: its "RPly: " line, without the file name it starts
// with, since the caller's message names the file already.
std::string plyFailureReason(const std::string& printed, const std::filesystem::path& path) {
  constexpr std::string_view kPrefix = "RPly: ";
  std::string reason;
  std::size_t start = 0;
  while (start < printed.size()) {
    std::size_t end = printed.find('\n', start);
    if (end == std::string::npos) {
      end = printed.size();
    }
    const std::string_view line(printed.data() + start, end - start);
    if (line.starts_with(kPrefix)) {
      reason = line.substr(kPrefix.size());
    }
    start = end + 1;
  }
  const std::string named = path.string() + ": ";
  if (reason.starts_with(named)) {
    reason.erase(0, named.size());
  }
  return reason.empty() ? "not a PLY point cloud" : reason;
}

}  // namespace

PointFileKind pointFileKind(const std::filesystem::path& path) {
  std::string extension = path.extension().string();
  for (char& c : extension) {
    c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  }
  // The extension starts with its dot when there is one.
  return pointFileKindForExtension(std::string_view(extension).substr(extension.empty() ? 0 : 1));
}

bool checkReadable(const std::filesystem::path& path, Error* error) {
  std::error_code ec;
  if (std::filesystem::is_directory(path, ec)) {
    fail(error, fmt::format("cannot open {}: it is a folder", path.string()));
    return false;
  }
  std::FILE* file = std::fopen(path.c_str(), "rb");
  if (file == nullptr) {
    fail(error,
         fmt::format("cannot open {}: {}", path.string(), std::generic_category().message(errno)));
    return false;
  }
  std::fclose(file);
  return true;
}

void reportFailure(std::string_view message) {
  std::fflush(stdout);
  std::fprintf(stderr, "cloudreel: %.*s\n", static_cast<int>(message.size()), message.data());
}

void announceLargeFile(const std::filesystem::path& path) {
  std::error_code ec;
  const std::uintmax_t bytes = std::filesystem::file_size(path, ec);
  if (!ec && bytes >= kLargeFileBytes) {
    std::fprintf(stderr, "Reading %s (%.0f MB)...\n", path.c_str(),
                 static_cast<double>(bytes) / 1e6);
    std::fflush(stderr);
  }
}

std::shared_ptr<PointLayer> openPointCloud(const std::filesystem::path& path, PointFileKind kind,
                                           std::int32_t downsample, Error* error) {
  if (kind == PointFileKind::Unknown) {
    fail(error, fmt::format("{}: not a point file (expected .rwb, .ply or .out)", path.string()));
    return nullptr;
  }
  if (!checkReadable(path, error)) {
    return nullptr;
  }
  announceLargeFile(path);

  // On success the capture passes on what was printed; on failure it is
  // dropped (a failed layer's teardown logs too) and only the reason kept.
  StandardErrorCapture capture;
  if (kind == PointFileKind::Ply) {
    std::shared_ptr<PointLayer> layer = PLYFile::initWithURLDownsample(path, downsample);
    if (!layer) {
      fail(error, fmt::format("cannot read points from {}: {}", path.string(),
                              plyFailureReason(capture.release(), path)));
    }
    return layer;
  }

  // A bundle file's layer is made as its import makes it, but loaded here
  // so that a failure comes back as a value rather than an alert.
  std::shared_ptr<PointLayer> layer;
  if (kind == PointFileKind::Bundler) {
    layer = std::make_shared<BundlerFile>();
    layer->setOriginalURL(path);
  } else {
    layer = std::make_shared<PointLayer>();
  }
  layer->setName(lastPathComponent(path));
  Error loadError;
  // The result is inverted and a short read still answers success: only
  // the error tells.
  (void)layer->loadPointsFromURLError(path, &loadError);
  if (!loadError.message.empty()) {
    layer.reset();
    (void)capture.release();
    fail(error, fmt::format("cannot read points from {}: {}", path.string(), loadError.message));
    return nullptr;
  }
  return layer;
}

}  // namespace cloudreel::cli
