#pragma once
// Makes every archivable class of the scene model known to the archive by
// its class name (the geometry classes included), so documents can be read.

namespace cloudreel {

class ClassRegistry;

void registerCoreClasses(ClassRegistry& registry);

}  // namespace cloudreel
