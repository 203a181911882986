#include "render/render_options.h"

#include "camera/camera.h"

namespace cloudreel {

Value RenderOptions::valueForKey(std::string_view key) const {
  const auto it = values_.find(key);
  return it != values_.end() ? it->second : Value{};
}

void RenderOptions::setValueForKey(Value value, std::string_view key) {
  values_.insert_or_assign(std::string(key), std::move(value));
}

void RenderOptions::removeValueForKey(std::string_view key) {
  if (const auto it = values_.find(key); it != values_.end()) {
    values_.erase(it);
  }
}

bool RenderOptions::isYes(std::string_view key) const {
  const auto number = numberAs<double>(valueForKey(key));
  return number && *number == 1.0;
}

std::shared_ptr<Camera> RenderOptions::sceneCamera() const {
  return objectAs<Camera>(valueForKey(kRenderOptionSceneCamera));
}

void RenderOptions::setSceneCamera(std::shared_ptr<Camera> camera) {
  setValueForKey(ObjectPtr(std::move(camera)), kRenderOptionSceneCamera);
}

}  // namespace cloudreel
