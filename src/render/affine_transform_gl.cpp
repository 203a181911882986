#include "render/affine_transform_gl.h"

#include <epoxy/gl.h>

#include "geometry/affine_transform.h"

namespace cloudreel {

void glMultMatrix(const AffineTransform& transform) { glMultMatrixd(transform.mx().data()); }

void glMultTransposeMatrix(const AffineTransform& transform) {
  glMultTransposeMatrixd(transform.mx().data());
}

void glTranslate(const AffineTransform& transform) {
  const AffineTransform::Matrix& m = transform.mx();
  glTranslated(m[12], m[13], m[14]);
}

void glInverseTranslate(const AffineTransform& transform) {
  const AffineTransform::Matrix& m = transform.mx();
  glTranslated(-m[12], -m[13], -m[14]);
}

}  // namespace cloudreel
