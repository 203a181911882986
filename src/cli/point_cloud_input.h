#pragma once
// Opening a point file from the command line, shared by the commands: what
// kind of file a name is, the layer the file opens as, and failures told as
// one line naming the file.

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string_view>

#include "platform/error.h"
#include "scene/application_commands.h"

namespace cloudreel {
class PointLayer;
}

namespace cloudreel::cli {

// By extension, in any case: ".rwb", ".ply" or ".out" (a bundle file). The
// application's import takes only the lower-case names; the command line
// forgives the case.
PointFileKind pointFileKind(const std::filesystem::path& path);

// Writes "cloudreel: <message>" as one line on standard error.
void reportFailure(std::string_view message);

// Answers whether the file is there and can be read; if not, the error says
// why ("cannot open x.ply: No such file or directory"). A layer must not be
// sent looking for a missing point file: it would try the point cache
// folder and an open panel.
[[nodiscard]] bool checkReadable(const std::filesystem::path& path, Error* error);

// The stage line openPointCloud writes on standard error before reading a
// large file ("Reading x.ply (150 MB)..."); nothing for a small one.
void announceLargeFile(const std::filesystem::path& path);

// The layer the file opens as: a point layer loaded from a ".rwb" file, the
// PLYFile layer of every `downsample`-th vertex of a ".ply" file, or the
// BundlerFile layer (every point, the cameras in its child field) of a
// ".out" file. Large
// files get a stage line on standard error first. Null on failure, with the
// error's message saying what failed on which file ("cannot read points
// from x.rwb: Cannot read points: short read"); whatever the core or the
// PLY reader printed on the way is then held back, so that message is the
// only line a caller needs to print.
std::shared_ptr<PointLayer> openPointCloud(const std::filesystem::path& path, PointFileKind kind,
                                           std::int32_t downsample, Error* error);

}  // namespace cloudreel::cli
