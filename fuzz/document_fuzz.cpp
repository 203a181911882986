// Feeds arbitrary bytes to the document reader, as opening a file does:
// bytes -> keyed archive -> MyDocument. A read must either refuse the bytes
// and leave the document as it was, or give a document whose every part can
// be walked, applied, drawn into nothing and written again; the written
// archive must read back. Linked point files named by an input are looked
// for as always (missing ones are not found: open panels cancel headless).

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <span>

#include "camera/camera_path.h"
#include "fuzz_setup.h"
#include "platform/class_registry.h"
#include "scene/core_classes.h"
#include "scene/layer.h"
#include "scene/my_document.h"
#include "timeline/timeline.h"

namespace {

using namespace cloudreel;

[[noreturn]] void inconsistent(const char* what) {
  std::fprintf(stderr, "document_fuzz: %s\n", what);
  std::abort();
}

// Every layer of the tree, each child asked for by index as the outline
// does; bounded, since a decoded tree may share a subtree many times.
void walk(const MyDocument& document, const Layer* item, int depth, int& visited) {
  const int children = document.outlineViewNumberOfChildrenOfItem(item);
  for (int i = 0; i < children && visited < 10000 && depth < 64; ++i) {
    const auto child = document.outlineViewChildOfItem(i, item);
    if (!child) {
      inconsistent("the outline answered no child inside the count");
    }
    ++visited;
    (void)document.outlineViewObjectValueForTableColumnByItem("name", child.get());
    walk(document, child.get(), depth + 1, visited);
  }
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  fuzz::useFactoryDefaultsAndSilentLog();
  registerCoreClasses(ClassRegistry::shared());
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  MyDocument document;
  const auto camera = document.sceneCamera();
  Error error;
  if (!document.readFromDataOfTypeError({data, size}, "reel", &error)) {
    if (!document.layers().empty() || document.sceneCamera() != camera) {
      inconsistent("a failed read changed the document");
    }
    return 0;
  }
  int visited = 0;
  walk(document, nullptr, 0, visited);
  (void)document.cameraPaths();
  (void)document.discretePaths();
  if (const auto& timeline = document.timeline()) {
    (void)timeline->totalLengthInFrames();
    for (const float t : {0.0f, 0.5f, 3.0f}) {
      timeline->applyForTime(t);
    }
  }
  const Bytes written = document.dataOfTypeError("reel", &error);
  if (written.empty()) {
    return 0;  // an object that refuses to be archived again, said in the error
  }
  MyDocument again;
  if (!again.readFromDataOfTypeError(written, "reel", &error)) {
    inconsistent("a document written from a read one does not read back");
  }
  if (again.layers().size() != document.layers().size()) {
    inconsistent("the layers did not come back");
  }
  return 0;
}
