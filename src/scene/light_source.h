#pragma once
// The document's one light: a directional light coming from the direction
// of the layer's position (by default (1, 10, 3)), shown in the editor as a
// small wire ball and never in rendered frames.

#include <memory>

#include "scene/layer.h"

namespace cloudreel {

class LightSource : public Layer {
 public:
  LightSource();

  std::string_view className() const override { return "LightSource"; }

  // Sets light 0's position to (x, y, z, 0) from the position the light is
  // at, including a drag in progress (editingTransform): w = 0 makes it a
  // light from that direction, not a point light at that point.
  void setupLightSource() const;

  // A wire ball of radius 0.2, in editor frames only.
  void drawGLWithOptions(const RenderOptions& options) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
};

}  // namespace cloudreel
