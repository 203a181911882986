#pragma once
// The point layer made from a structure-from-motion reconstruction in the
// bundle-file text format: the reconstructed points become the layer's
// records, and every camera of the file becomes a BundlerCamera in a
// CameraField, the layer's first child, which the import also hands to the
// document as a camera path. Each camera gets its photograph from the
// reconstruction's "list.txt" when there is one.
//
// The file:
//   # any comment line
//   <cameras> <points>
//   <cameras> records of five lines (see BundlerCamera)
//   <points> records: "x y z", "r g b", and a view-list line (ignored)
//
// The layer is never written back to its file.

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string_view>
#include <vector>

#include "scene/point_layer.h"

namespace cloudreel {

class Camera;

class BundlerFile : public PointLayer {
 public:
  // A blank layer, as a document being decoded makes it.
  BundlerFile() = default;

  // The layer of the bundle file at `url`, linked to it when `shouldLink`,
  // named after the file. A load error is presented to the user and gives
  // no layer.
  static std::shared_ptr<BundlerFile> initWithURLShouldLink(const std::filesystem::path& url,
                                                            bool shouldLink);

  std::string_view className() const override { return "BundlerFile"; }

  // The cameras the file held (see loadPointsFromURLError), or after
  // decoding the length of `cameras`.
  std::int32_t ncameras() const { return ncameras_; }
  // Archived and copied, but the loader leaves it empty: the cameras it
  // reads go to the CameraField.
  const std::vector<std::shared_ptr<Camera>>& cameras() const { return cameras_; }

  // Reads the bundle file at `url`, answering by the point file's inverted
  // convention (YES on failure) with the error in the application's point
  // file domain, code 100: "Cannot open file", "File corrupt: short read"
  // (not even a first line), "Cannot allocate point array" (the cameras
  // already read stay as the child field).
  //
  // A file that ends early is not an error: the layer holds the cameras and
  // points the file begins, a record cut short reading 0 for what it
  // lacks, so ncameras and nPoints can be below the header's counts. A
  // negative count reads as 0, and the point array is never larger than the
  // rest of the file could fill (11 bytes a point at the least), so an
  // absurd header claims no memory. Cameras beyond the lines of "list.txt"
  // get no photograph. A view list longer than 511 characters is not
  // consumed whole and the reading goes out of step from there on, as it
  // always has.
  bool loadPointsFromURLError(const std::filesystem::path& url, Error* error) override;
  // Writes nothing and answers NO (success by the inverted convention).
  bool savePointsToURLError(const std::filesystem::path& url, Error* error) const override;
  // Does nothing: a bundle file is never written back.
  void saveLinkedLayer() override {}
  bool hasTrueColor() const override { return true; }

  // After the point layer keys: "cameras" (the list), for inline layers
  // only. Decoding sets ncameras to the list's length.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  // The point layer copy, ncameras and a new list of the same cameras.
  void copyInto(Animatable3DObject& target) const override;

 private:
  std::int32_t ncameras_ = 0;
  std::vector<std::shared_ptr<Camera>> cameras_;
};

}  // namespace cloudreel
