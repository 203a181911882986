#include "camera/bundler_camera.h"

#include <array>

#include "import/text_scanner.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"

namespace cloudreel {

std::shared_ptr<BundlerCamera> BundlerCamera::initWithFileHandleFileIndex(TextScanner& in,
                                                                          int fileIndex) {
  auto camera = std::make_shared<BundlerCamera>();
  std::array<double, 3> lens{};
  std::array<std::array<double, 3>, 3> r{};
  std::array<double, 3> t{};
  for (auto* line : {&lens, &r[0], &r[1], &r[2], &t}) {
    for (double& value : *line) {
      (void)in.scan(value);
    }
  }
  camera->setFocal(lens[0]);
  camera->setK1(lens[1]);
  camera->setK2(lens[2]);

  // Column j of the orientation is row j of R: the camera-to-world rotation.
  AffineTransform::Matrix m{};
  for (std::size_t j = 0; j < 3; ++j) {
    for (std::size_t i = 0; i < 3; ++i) {
      m[4 * j + i] = r[j][i];
    }
  }
  m[15] = 1.0;
  camera->inertialToObject()->setDoubles(m);

  std::array<double, 3> centre{};
  for (std::size_t i = 0; i < 3; ++i) {
    centre[i] = -(r[0][i] * t[0] + r[1][i] * t[1] + r[2][i] * t[2]);
  }
  camera->objectToWorld()->setTranslation(centre);
  camera->fileIndex_ = fileIndex;
  return camera;
}

void BundlerCamera::encodeWithCoder(KeyedArchiver& coder) const {
  SourceCamera::encodeWithCoder(coder);
  coder.encodeInt32(fileIndex_, "fileIndex");
  coder.encodeBool(selected(), "selected");
}

void BundlerCamera::initWithCoder(KeyedUnarchiver& coder) {
  SourceCamera::initWithCoder(coder);
  fileIndex_ = coder.decodeInt32ForKey("fileIndex");
  setSelected(coder.decodeBoolForKey("selected"));
}

std::shared_ptr<Animatable3DObject> BundlerCamera::makeBlank() const {
  return std::make_shared<BundlerCamera>();
}

void BundlerCamera::copyInto(Animatable3DObject& target) const {
  SourceCamera::copyInto(target);
  static_cast<BundlerCamera&>(target).fileIndex_ = fileIndex_;
}

}  // namespace cloudreel
