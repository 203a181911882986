#pragma once
// `cloudreel info DOC.reel [--json]`: what a document holds: its layer
// tree, camera paths, transform stacks, timeline, scene camera, bookmarks
// and bucket settings, as an indented text or one JSON object.

#include <filesystem>

namespace cloudreel::cli {

// Answers the process's exit status; a document that cannot be read is
// one line on standard error.
int describeDocument(const std::filesystem::path& path, bool json);

}  // namespace cloudreel::cli
