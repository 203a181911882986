#include "scene/light_source.h"

#include <epoxy/gl.h>

#include "render/gl/shapes.h"
#include "render/render_options.h"

namespace cloudreel {

LightSource::LightSource() { objectToWorld()->setTranslation({1.0, 10.0, 3.0}); }

std::shared_ptr<Animatable3DObject> LightSource::makeBlank() const {
  return std::make_shared<LightSource>();
}

void LightSource::setupLightSource() const {
  const auto placed = objectToWorld()->copy();
  placed->multiplyByMatrix(*editingTransform());
  std::array<double, 3> t{};
  placed->getTranslation(t);
  const GLfloat position[4] = {narrowToFloat(t[0]), narrowToFloat(t[1]), narrowToFloat(t[2]), 0.0f};
  glLightfv(GL_LIGHT0, GL_POSITION, position);
}

void LightSource::drawGLWithOptions(const RenderOptions& options) {
  if (options.isYes(kRenderOptionEditor)) {
    gl::drawWireSphere(0.2, 7, 7);
  }
}

}  // namespace cloudreel
