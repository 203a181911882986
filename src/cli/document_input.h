#pragma once
// Reading and writing a document (".reel") from the command line, shared by
// `import` and `info`: the one-time setup documents need, and reads and
// saves whose failures come back as one line naming the document.

#include <filesystem>

#include "platform/error.h"

namespace cloudreel {
class MyDocument;
}

namespace cloudreel::cli {

// Whether the name ends in ".reel", in any case.
bool isDocumentFile(const std::filesystem::path& path);

// Makes the archive's classes known and registers the application's factory
// settings under the user's own, as the application does at start: a
// document decodes its objects by class name, and new layers, cameras and
// paths take their point size, colours and frame rate from the defaults.
// Calling it again changes nothing.
void prepareForDocuments();

// Replaces the document's contents by the file's. On failure the error's
// message names the document, then the reason ("x.reel: The document is
// corrupt", or the missing linked point file's error naming that file);
// whatever the core printed on the
// way (a layer presenting its error) is held back, so the caller's one line
// is all the user sees. On success what was printed is passed on.
[[nodiscard]] bool readDocument(MyDocument& document, const std::filesystem::path& path,
                                Error* error);

// Saves atomically, with a stage line first for a large document. The
// error's message names the document ("Cannot save x.reel: ...").
[[nodiscard]] bool writeDocument(MyDocument& document, const std::filesystem::path& path,
                                 Error* error);

}  // namespace cloudreel::cli
