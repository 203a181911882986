#pragma once
// A camera of a bundle file: its focal length, distortion and pose read
// from the camera's record, and its position (from 0) in the file's camera
// list, which is the camera's number.
//
// The record is five lines of three numbers: focal, k1, k2; the three rows
// of the world-to-camera rotation R; the translation t. The file's cameras
// look down their own −z with +y up, as this application's do, so no axis
// is flipped: the orientation is Rᵀ and the position −Rᵀ·t.

#include <memory>
#include <string_view>

#include "camera/source_camera.h"

namespace cloudreel {

class TextScanner;

class BundlerCamera : public SourceCamera {
 public:
  BundlerCamera() = default;
  // Reads the camera's record at the scanner's position. A record cut short
  // by the end of the file, or with a field that is not a number, has 0
  // for each value it lacks (a zero rotation for a missing block of rows).
  static std::shared_ptr<BundlerCamera> initWithFileHandleFileIndex(TextScanner& in, int fileIndex);

  std::string_view className() const override { return "BundlerCamera"; }

  int fileIndex() const { return fileIndex_; }
  int number() const override { return fileIndex_; }

  // After the source camera keys: "fileIndex" (int), "selected" (bool).
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  // The source camera copy and the file index.
  void copyInto(Animatable3DObject& target) const override;

 private:
  int fileIndex_ = 0;
};

}  // namespace cloudreel
