#pragma once
// The point layer made from a structure-from-motion reconstruction in the
// bundle-file text format: the reconstructed points become the layer's
// records, and every camera of the file becomes a BundlerCamera in a
// CameraField, the layer's first child, which the import also hands to the
// document as a camera path. Each camera gets its photograph from the
// reconstruction's "list.txt" when there is one: line i names camera i's
// photograph, relative to the reconstruction's root folder. A name that
// names no file there, as a list written on another machine holds that
// machine's paths, falls back to the longest trailing part of it that names
// a file under the root ("/home/x/proj/images/a.jpg" finds
// root/images/a.jpg, else root/a.jpg).
//
// The file:
//   # any comment line
//   <cameras> <points>
//   <cameras> records of five lines (see BundlerCamera)
//   <points> records: "x y z", "r g b", and a view-list line (skipped)
//
// The layer is never written back to its file.

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string_view>
#include <vector>

#include "import/bundle_points.h"
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
  // convention (YES on failure) with the error in the application's own
  // domain (kApplicationErrorDomain, on purpose not the point file's),
  // code 100: "Cannot open file", "File corrupt: short read" (not even a
  // first line), "The file claims N cameras, more than a reconstruction of
  // B bytes has" (more than 4096 cameras and more than one for every 256
  // bytes of the file: a camera object takes kilobytes, so such a count
  // could claim many times the file's size; nothing is made), "Cannot
  // allocate point array" (the cameras already read stay as the child
  // field).
  //
  // A file that ends early is not an error: the layer holds the cameras and
  // points the file begins, a record cut short reading 0 for what it
  // lacks, so ncameras and nPoints can be below the header's counts. A
  // negative count reads as 0, and neither the cameras nor the point array
  // are ever more than the rest of the file could fill (29 bytes a camera,
  // 11 a point at the least), so an absurd header claims no memory. Cameras
  // beyond the lines of "list.txt" get no photograph. A view list is
  // skipped whole however long it is, so the points after it stay in step;
  // a reading that took at most 511 characters of it, as the format's first
  // reader did, went out of step after a long one.
  //
  // The points are read on every core (see readBundlePoints), with the
  // records, count and box a reading on one thread gives, for any file.
  bool loadPointsFromURLError(const std::filesystem::path& url, Error* error) override;
  // How the points are read: on every core by default. A setting of the
  // reading, not of the layer: it is neither archived nor copied.
  void setPointReading(const BundlePointReading& reading) { pointReading_ = reading; }

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
  BundlePointReading pointReading_;
};

}  // namespace cloudreel
