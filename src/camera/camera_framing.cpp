#include "camera/camera_framing.h"

#include <algorithm>
#include <cmath>
#include <numbers>

#include "camera/camera.h"

namespace cloudreel {

bool isFramableBox(const Layer::BoundingBox& b) {
  const bool finite = std::all_of(b.begin(), b.end(), [](double v) { return std::isfinite(v); });
  return finite && b[0] <= b[3] && b[1] <= b[4] && b[2] <= b[5] &&
         !(b[0] == b[3] && b[1] == b[4] && b[2] == b[5]);
}

void addBoxToUnion(std::optional<Layer::BoundingBox>& total, const Layer::BoundingBox& box) {
  if (!isFramableBox(box)) {
    return;
  }
  if (!total) {
    total = box;
    return;
  }
  for (std::size_t axis = 0; axis < 3; ++axis) {
    (*total)[axis] = std::min((*total)[axis], box[axis]);
    (*total)[axis + 3] = std::max((*total)[axis + 3], box[axis + 3]);
  }
}

Layer::BoundingBox worldBoundingBoxOfLayer(const Layer& layer) {
  // Points go through inertialToObject first, objectToWorld last; B·A is
  // built by A.multiplyByMatrix(B).
  AffineTransform placement(layer.inertialToObject()->mx());
  placement.multiplyByMatrix(*layer.animationTransform());
  placement.multiplyByMatrix(*layer.objectToWorld());
  const Layer::BoundingBox& b = layer.bbox();
  Layer::BoundingBox out{};
  for (int corner = 0; corner < 8; ++corner) {
    std::array<double, 3> p{b[(corner & 1) != 0 ? 3 : 0], b[(corner & 2) != 0 ? 4 : 1],
                            b[(corner & 4) != 0 ? 5 : 2]};
    placement.multiply3Vector(p);
    for (std::size_t axis = 0; axis < 3; ++axis) {
      out[axis] = corner == 0 ? p[axis] : std::min(out[axis], p[axis]);
      out[axis + 3] = corner == 0 ? p[axis] : std::max(out[axis + 3], p[axis]);
    }
  }
  return out;
}

CameraFraming framingOfBoxForCamera(const Camera& camera, const Layer::BoundingBox& box) {
  CameraFraming framing;
  framing.zNear = camera.zNear();
  framing.zFar = camera.zFar();
  camera.objectToWorld()->getTranslation(framing.position);
  if (!isFramableBox(box)) {
    return framing;
  }
  const double cx = (box[0] + box[3]) / 2, cy = (box[1] + box[4]) / 2, cz = (box[2] + box[5]) / 2;
  const double radius = std::hypot(box[3] - box[0], box[4] - box[1], box[5] - box[2]) / 2;
  double halfAngle = std::clamp(static_cast<double>(camera.fieldOfView()), 1.0, 179.0) / 2 *
                     std::numbers::pi / 180;
  // A NaN field of view survives the clamp; it frames as the narrowest.
  if (!(halfAngle > 0)) {
    halfAngle = 0.5 * std::numbers::pi / 180;
  }
  if (const double aspect = camera.aspect(); aspect > 0 && aspect < 1) {
    halfAngle = std::atan(aspect * std::tan(halfAngle));
  }
  const double distance = 1.1 * radius / std::sin(halfAngle);
  // The camera looks down its local -z; its local +z in the world is the
  // third column of its orientation.
  const auto& m = camera.inertialToObject()->mx();
  double back[3] = {m[8], m[9], m[10]};
  const double length = std::hypot(back[0], back[1], back[2]);
  if (length > 0 && std::isfinite(length)) {
    for (double& v : back) {
      v /= length;
    }
  } else {
    back[0] = 0;
    back[1] = 0;
    back[2] = 1;
  }
  framing.position = {cx + back[0] * distance, cy + back[1] * distance, cz + back[2] * distance};
  // distance > 1.1 × radius, so the near plane stays in front of the camera.
  framing.zNear = static_cast<float>(std::max((distance - radius) * 0.5, distance * 1e-4));
  framing.zFar = static_cast<float>((distance + radius) * 1.5);
  return framing;
}

void frameBoxWithCamera(Camera& camera, const Layer::BoundingBox& box) {
  const CameraFraming framing = framingOfBoxForCamera(camera, box);
  camera.setTranslate(Vector3(framing.position));
  camera.setZNear(framing.zNear);
  camera.setZFar(framing.zFar);
}

}  // namespace cloudreel
