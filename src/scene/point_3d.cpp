#include "scene/point_3d.h"

#include <epoxy/gl.h>

#include "render/gl/shapes.h"

namespace cloudreel {

Point3D::Point3D() { setName("3D Point"); }

std::shared_ptr<Animatable3DObject> Point3D::makeBlank() const {
  return std::make_shared<Point3D>();
}

void Point3D::drawGLWithOptions(const RenderOptions&) {
  glColor3f(0.0f, 1.0f, 0.0f);
  gl::drawSolidSphere(0.1, 10, 10);
}

}  // namespace cloudreel
