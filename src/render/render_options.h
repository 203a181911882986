#pragma once
// The options dictionary handed down every draw call: which camera is being
// looked through, whether the frame is for the editor (helpers, frusta and
// gizmos shown) or a rendered frame, and the document-wide bucket override.
// The interactive view and the off-screen renderer each own one and fill it
// before drawing; layers only read it.

#include <map>
#include <memory>
#include <string>
#include <string_view>

#include "platform/value.h"

namespace cloudreel {

class Camera;
class CpuPointPass;

// The camera being looked through, or null.
inline constexpr std::string_view kRenderOptionSceneCamera = "RWRenderOption_SceneCamera";
// YES when drawing for the editor.
inline constexpr std::string_view kRenderOptionEditor = "RWRenderOption_Editor";
// YES when the global bucket fraction replaces each point layer's own limit.
inline constexpr std::string_view kRenderOptionBucketOverride = "RWRenderOption_BucketOverride";
// The global bucket fraction (a float).
inline constexpr std::string_view kRenderOptionBucketGlobal = "RWRenderOption_BucketGlobal";

class RenderOptions {
 public:
  // Null for a key that holds nothing.
  Value valueForKey(std::string_view key) const;
  void setValueForKey(Value value, std::string_view key);
  void removeValueForKey(std::string_view key);

  // True exactly when the key holds a number equal to YES (1); an absent
  // key, NO, a string or an object is not.
  bool isYes(std::string_view key) const;

  // The camera under kRenderOptionSceneCamera; null when there is none or
  // the value is not a camera.
  std::shared_ptr<Camera> sceneCamera() const;
  void setSceneCamera(std::shared_ptr<Camera> camera);

  // The CPU point pass of an off-screen frame, which plain point layers
  // hand their points to; null where everything is drawn through OpenGL
  // (the interactive view). Not owned.
  CpuPointPass* cpuPointPass() const { return cpuPointPass_; }
  void setCpuPointPass(CpuPointPass* pass) { cpuPointPass_ = pass; }

 private:
  std::map<std::string, Value, std::less<>> values_;
  CpuPointPass* cpuPointPass_ = nullptr;
};

}  // namespace cloudreel
