#pragma once
// Hands AffineTransforms to the fixed-function matrix stack. The transform
// is stored column-major, exactly as the stack takes it.
//
// There is no general inverse: a rigid transform is undone by the transpose
// of its rotation (glMultTransposeMatrix of a copy without translation)
// followed by glInverseTranslate.

namespace cloudreel {

class AffineTransform;

// Multiplies the current matrix by the transform.
void glMultMatrix(const AffineTransform& transform);
// Multiplies the current matrix by the transform's transpose.
void glMultTransposeMatrix(const AffineTransform& transform);
// Translates by the transform's translation, or by its negation.
void glTranslate(const AffineTransform& transform);
void glInverseTranslate(const AffineTransform& transform);

}  // namespace cloudreel
