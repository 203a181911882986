#include "camera/zxy_camera_path.h"

#include <cmath>
#include <fstream>
#include <iterator>
#include <string>

namespace cloudreel {

namespace {

// Degrees to radians, rounded to single precision as the angles have always
// been before their sines and cosines are taken.
float radians(double degrees) { return narrowToFloat(degrees * 3.141592653589793 / 180.0); }

// x y z α β γ. The rotation is the type-0 Euler rotation of (β, α, γ) with
// A = β, B = α, C = γ, element 9 included as that rotation writes it, but
// with storage 15 left 0: both are what saved paths were made with.
void fillFromAnglesLine(const std::array<double, 16>& v, CameraPathRecord& record) {
  record.position = {v[0], v[1], v[2]};
  const double a = radians(v[4]);
  const double b = radians(v[3]);
  const double c = radians(v[5]);
  const double sA = std::sin(a), cA = std::cos(a);
  const double sB = std::sin(b), cB = std::cos(b);
  const double sC = std::sin(c), cC = std::cos(c);
  auto& m = record.matrix;
  m = {};
  m[0] = cB;
  m[1] = sB * cA;
  m[2] = sB * sA;
  m[4] = -sB * cC;
  m[5] = cA * cB * cC - sA * sC;
  m[6] = sA * cB * cC + cA * sC;
  m[8] = sB * sC;
  m[9] = -sA * cC - cB * sA * sC;
  m[10] = cA * cC - cB * sA * sC;
}

}  // namespace

std::shared_ptr<ZXYCameraPath> ZXYCameraPath::initWithText(std::string_view text) {
  auto path = std::make_shared<ZXYCameraPath>();
  if (!path->readRecordsFromText(text, 6, fillFromAnglesLine)) {
    return nullptr;
  }
  return path;
}

std::shared_ptr<ZXYCameraPath> ZXYCameraPath::initWithURL(const std::filesystem::path& url) {
  std::ifstream in(url, std::ios::binary);
  auto path = initWithText(
      std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()));
  if (path) {
    path->setName(url.filename().string());
  }
  return path;
}

std::shared_ptr<Animatable3DObject> ZXYCameraPath::makeBlank() const {
  return std::make_shared<ZXYCameraPath>();
}

}  // namespace cloudreel
