#pragma once
// Makes the geometry classes known to the archive by their class names.

namespace cloudreel {

class ClassRegistry;

void registerGeometryClasses(ClassRegistry& registry);

}  // namespace cloudreel
