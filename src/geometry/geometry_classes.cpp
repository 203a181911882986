#include "geometry/geometry_classes.h"

#include "geometry/affine_transform.h"
#include "geometry/vector3.h"
#include "platform/class_registry.h"

namespace cloudreel {

void registerGeometryClasses(ClassRegistry& registry) {
  registry.registerClass<Vector3>("Vector3");
  registry.registerClass<AffineTransform>("AffineTransform");
}

}  // namespace cloudreel
