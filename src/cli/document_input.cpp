#include "cli/document_input.h"

#include <cctype>
#include <cstdio>
#include <string>

#include "cli/point_cloud_input.h"
#include "cli/standard_error_capture.h"
#include "platform/application_defaults.h"
#include "platform/class_registry.h"
#include "platform/user_defaults.h"
#include "scene/core_classes.h"
#include "scene/layer.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"

namespace cloudreel::cli {

namespace {

// As for point files: from this many bytes of points on, a save takes long
// enough to be worth a stage line.
constexpr std::size_t kLargeDocumentBytes = std::size_t{32} << 20;

// The point bytes the save writes into the archive itself: those of inline
// top-level point layers (a linked layer's records stay in its own file).
std::size_t inlinePointBytes(const MyDocument& document) {
  std::size_t bytes = 0;
  for (const auto& layer : document.layers()) {
    const auto* points = dynamic_cast<const PointLayer*>(layer.get());
    if (points != nullptr && !points->fileStoredAsLink()) {
      bytes += points->byteSize();
    }
  }
  return bytes;
}

}  // namespace

bool isDocumentFile(const std::filesystem::path& path) {
  std::string extension = path.extension().string();
  for (char& c : extension) {
    c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  }
  return extension == "." + std::string(kDocumentExtension);
}

void prepareForDocuments() {
  static const bool prepared = [] {
    registerCoreClasses(ClassRegistry::shared());
    registerApplicationDefaults(UserDefaults::standardUserDefaults());
    return true;
  }();
  (void)prepared;
}

bool readDocument(MyDocument& document, const std::filesystem::path& path, Error* error) {
  if (!checkReadable(path, error)) {
    return false;
  }
  StandardErrorCapture capture;
  Error reason;
  if (!document.readFromURLError(path, &reason)) {
    (void)capture.release();
    setError(error, reason.domain, reason.code, path.string() + ": " + reason.message);
    return false;
  }
  return true;
}

bool writeDocument(MyDocument& document, const std::filesystem::path& path, Error* error) {
  if (inlinePointBytes(document) >= kLargeDocumentBytes) {
    std::fprintf(stderr, "Writing %s...\n", path.c_str());
    std::fflush(stderr);
  }
  StandardErrorCapture capture;
  if (!document.writeToURLError(path, error)) {
    (void)capture.release();
    return false;
  }
  return true;
}

}  // namespace cloudreel::cli
