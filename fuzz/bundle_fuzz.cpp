// Feeds arbitrary bytes to the bundle-file import as the bundle file of a
// reconstruction laid out as the import expects it: root/bundle/bundle.out,
// with root/list.txt naming the photographs. The list is fixed and names, in
// camera order, a PNG and a JPEG that are there (one by a "/"-rooted name),
// a file that is not an image, a folder, a missing file, a blank line, the
// PNG again, and the JPEG by another machine's path that is found by its
// trailing part, so every way a camera gets or lacks a photograph is taken.
//
// The layer is made as the application's import makes it, then everything
// it claims is read: every byte of the records, the bounding box, each
// camera's pose, field of view and photograph size, and the field's cameras
// by frame and by time. The reader must answer what it cannot read without a
// crash, a leak, undefined behaviour or an allocation the file's size does
// not justify.

#include <stb/stb_image_write.h>
#include <unistd.h>

#include <array>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "camera/bundler_camera.h"
#include "camera/camera_field.h"
#include "import/bundler_file.h"
#include "fuzz_setup.h"
#include "scratch_file.h"

namespace {

using namespace cloudreel;

// The reconstruction's folder, made once and removed when the program exits.
class Reconstruction {
 public:
  Reconstruction()
      : root_(fuzz::scratchFolder() / (std::to_string(::getpid()) + "-bundle_fuzz")),
        bundle_(root_ / "bundle" / "bundle.out") {
    std::filesystem::create_directories(root_ / "bundle");
    std::filesystem::create_directories(root_ / "images" / "folder.jpg");
    const std::vector<std::uint8_t> grey(4 * 3, 99);
    if (stbi_write_png((root_ / "images/a.png").c_str(), 4, 3, 1, grey.data(), 4) == 0 ||
        stbi_write_jpg((root_ / "images/b.jpg").c_str(), 3, 4, 1, grey.data(), 90) == 0) {
      std::fprintf(stderr, "bundle_fuzz: cannot write the photographs in %s\n", root_.c_str());
      std::abort();
    }
    write(root_ / "images/text.jpg", "not a photograph\n");
    // A CR LF pair counts as two line ends, so it leaves a blank line for
    // the third camera.
    write(root_ / "list.txt",
          "images/a.png 0 1234.5\n/images/b.jpg\r\nimages/text.jpg\nimages/folder.jpg\n"
          "images/missing.jpg 0 1\n\nimages/a.png\n/home/elsewhere/proj/images/b.jpg\n");
  }
  ~Reconstruction() {
    std::error_code ignored;
    std::filesystem::remove_all(root_, ignored);
  }
  Reconstruction(const Reconstruction&) = delete;
  Reconstruction& operator=(const Reconstruction&) = delete;

  const std::filesystem::path& bundle() const { return bundle_; }

 private:
  static void write(const std::filesystem::path& path, const std::string& text) {
    fuzz::writeScratchFile(path, reinterpret_cast<const std::uint8_t*>(text.data()), text.size());
  }

  std::filesystem::path root_;
  std::filesystem::path bundle_;
};

Reconstruction& reconstruction() {
  static Reconstruction folder;
  return folder;
}

[[noreturn]] void fail(const char* what) {
  std::fprintf(stderr, "bundle_fuzz: %s\n", what);
  std::abort();
}

// Folds a number into the sum so no read can be optimised away; a NaN or an
// infinity adds a fixed amount instead of spoiling the rest.
void add(double& sum, double v) { sum += std::isfinite(v) ? v : 1.0; }

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  fuzz::useFactoryDefaultsAndSilentLog();
  (void)reconstruction();
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::writeScratchFile(reconstruction().bundle(), data, size);
  const auto layer = BundlerFile::initWithURLShouldLink(reconstruction().bundle(), false);
  if (!layer) {
    return 0;
  }

  double sum = 0.0;
  // What the layer claims must lie inside what it holds: ASan reports any
  // byte read past the array.
  const std::uint8_t* points = layer->points();
  if (layer->nPoints() < 0 || (layer->nPoints() > 0 && points == nullptr)) {
    fail("a point count without the points");
  }
  const std::size_t bytes = static_cast<std::size_t>(layer->nPoints()) * layer->recordSize();
  for (std::size_t i = 0; i < bytes; ++i) {
    sum += points[i];
  }
  // The box holds every point (a NaN in the box or a point compares false
  // and is let be).
  const Layer::BoundingBox& box = layer->bbox();
  for (const color_point& point : layer->colorPoints()) {
    const std::array<float, 3> xyz = {point.x, point.y, point.z};
    for (std::size_t axis = 0; axis < 3; ++axis) {
      if (xyz[axis] < box[axis] || xyz[axis] > box[axis + 3]) {
        fail("a point outside the bounding box");
      }
      add(sum, xyz[axis]);
    }
  }
  for (const double v : box) {
    add(sum, v);
  }

  if (layer->childLayerCount() != 1) {
    fail("the cameras are not the layer's one child");
  }
  const auto field = std::dynamic_pointer_cast<CameraField>(layer->childLayers()[0]);
  if (!field || field->nFrames() != layer->ncameras()) {
    fail("the camera field does not hold the cameras counted");
  }
  // The photograph widths the list gives the cameras, whatever the file.
  constexpr std::array<int, 9> kWidths = {4, 3, 0, 0, 0, 0, 0, 4, 3};
  for (std::size_t i = 0; i < field->cameras().size(); ++i) {
    const auto* bundler = dynamic_cast<const BundlerCamera*>(field->cameras()[i].get());
    if (bundler == nullptr || bundler->number() != static_cast<int>(i)) {
      fail("a camera that is not the file's");
    }
    if (bundler->imageWidth() != (i < kWidths.size() ? kWidths[i] : 0) ||
        bundler->hasImage() != (bundler->imageWidth() > 0)) {
      fail("a camera with the wrong photograph");
    }
    add(sum, bundler->number() + bundler->fieldOfView() + bundler->fieldOfViewInRadians() +
                 bundler->aspect() + bundler->imageWidth() + bundler->imageHeight() +
                 bundler->hasImage());
    add(sum, bundler->focal() + bundler->k1() + bundler->k2());
    add(sum, bundler->positionX() + bundler->positionY() + bundler->positionZ());
    add(sum, bundler->inertialToObject()->determinant() + bundler->inertialToObject()->scale());
  }
  // The field hands out copies by frame and by time, in world space too;
  // out of range asks must answer null.
  for (const std::int32_t frame : {-1, 0, field->nFrames() / 2, field->nFrames()}) {
    const auto camera = field->cameraInWorldSpaceForFrame(frame);
    if ((camera != nullptr) != (frame >= 0 && frame < field->nFrames())) {
      fail("a camera for a frame outside the field, or none for one inside");
    }
    if (camera) {
      add(sum, camera->fieldOfView() + camera->positionX());
    }
  }
  for (const float t : {0.0f, 0.5f, 0.999f, 1.0f}) {
    if (const auto camera = field->cameraInObjectSpaceForTime(t)) {
      add(sum, camera->fieldOfViewInRadians());
    }
  }
  volatile double sink = sum;
  (void)sink;
  return 0;
}
