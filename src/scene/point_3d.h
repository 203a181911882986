#pragma once
// A small green marker ball the user drops into the scene to mark a place.
// It has no properties of its own and archives only the layer keys.

#include <memory>
#include <string_view>

#include "scene/layer.h"

namespace cloudreel {

class Point3D : public Layer {
 public:
  // Named "3D Point".
  Point3D();

  std::string_view className() const override { return "Point3D"; }

  // A green solid ball of radius 0.1, in the current colour state (unlit
  // unless the caller has lighting on).
  void drawGLWithOptions(const RenderOptions& options) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
};

}  // namespace cloudreel
