#pragma once
// A node of the scene's layer tree: a named, visible-or-hidden object with
// child layers, a bounding box, a billboard mode and a fog switch, that draws
// itself inside the transforms its placement sets up. Concrete layers
// (points, primitives, camera paths, ...) override drawGLWithOptions to draw
// their content in object coordinates.

#include <array>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "scene/animatable_3d_object.h"

namespace cloudreel {

class RenderOptions;

inline constexpr std::string_view kLayerActivateNotification =
    "KTPointDocument_LayerActivateNotification";
inline constexpr std::string_view kLayerDeactivateNotification =
    "KTPointDocument_LayerDeactivateNotification";

class Layer : public Animatable3DObject {
 public:
  // minX, minY, minZ, maxX, maxY, maxZ
  using BoundingBox = std::array<double, 6>;

  Layer() = default;

  // A key the document observes for undo, and the undo step's name.
  struct UndoableKey {
    std::string_view key;
    std::string_view actionName;
  };

  std::string_view className() const override { return "Layer"; }
  const PropertyTable& properties() const override;

  // An empty name is the layer without one; a copy of it stays unnamed.
  const std::string& name() const { return name_; }
  const std::vector<std::shared_ptr<Layer>>& childLayers() const { return childLayers_; }
  bool isVisible() const { return isVisible_; }
  bool isInWorld() const { return isInWorld_; }
  // Stored, copied and archived; nothing else consults them.
  bool animate() const { return animate_; }
  std::int32_t animationPath() const { return animationPath_; }
  float billboardDistance() const { return billboardDistance_; }
  const BoundingBox& bbox() const { return bbox_; }
  bool enableFog() const { return enableFog_; }
  bool displayListInvalid() const { return displayListInvalid_; }
  bool isModified() const { return isModified_; }

  void setName(std::string v) { changeValueForKey("name", name_, std::move(v)); }
  void setChildLayers(std::vector<std::shared_ptr<Layer>> v);
  void setIsVisible(bool v) { changeValueForKey("isVisible", isVisible_, v); }
  void setIsInWorld(bool v) { changeValueForKey("isInWorld", isInWorld_, v); }
  void setAnimate(bool v) { changeValueForKey("animate", animate_, v); }
  void setAnimationPath(std::int32_t v) { changeValueForKey("animationPath", animationPath_, v); }
  // A negative or not-a-number distance is stored as 0.
  void setBillboardDistance(float v);
  void setEnableFog(bool v) { changeValueForKey("enableFog", enableFog_, v); }
  void setDisplayListInvalid(bool v) { displayListInvalid_ = v; }
  void setIsModified(bool v) { changeValueForKey("isModified", isModified_, v); }
  // The arguments come min, max per axis, as floats; bbox() holds them in
  // its own order as doubles.
  void setBoundingBox(const BoundingBox& box) { bbox_ = box; }
  void setBoundingBoxWithMinXMaxXMinYMaxYMinZMaxZ(float minX, float maxX, float minY, float maxY,
                                                  float minZ, float maxZ);

  // Appends a child; observers of "childLayers" (the outline) are told.
  void addChildLayer(std::shared_ptr<Layer> child);
  int childLayerCount() const { return static_cast<int>(childLayers_.size()); }

  // Marks cached drawing data for rebuilding on the next draw. Layers that
  // keep GPU caches of their own also release them here.
  virtual void invalidateOpenGLDisplayLists() { displayListInvalid_ = true; }

  // What kind of layer this is, for the panels and commands.
  virtual bool isPointLayer() const { return false; }
  virtual bool hasCameras() const { return false; }
  // Bytes of point data the layer holds.
  virtual std::size_t byteSize() const { return 0; }
  // Hooks for layers that animate by themselves; the base does nothing.
  virtual void setFrameForTime(float seconds);
  // A "Transform" track driving the animation transform.
  void getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) override;
  virtual void multiplyTransformByQuaternion(const std::array<double, 4>& q);

  // Posts a notification with this layer as object on the default centre;
  // the outline and property panels follow the selection through these.
  void postNotification(std::string_view name) const;
  void sendSelectNotification() const { postNotification(kLayerActivateNotification); }
  void sendDeselectNotification() const { postNotification(kLayerDeactivateNotification); }

  // Also makes the document observe "name" ("Change Name") and "isVisible"
  // ("Layer Visibility") for undo.
  void addObserversForDocument(MyDocument* document) override;
  void removeObserversForDocument(MyDocument* document) override;

  // The draw traversal: push; the scene camera's viewing transform (or, for
  // a billboard, a fixed offset in front of the viewer); objectToWorld; the
  // editing gizmo when editing in the editor; inertialToObject; own content
  // if visible; then each visible child's content (their drawGLWithOptions
  // alone, in this frame: a child's own transforms, billboard mode and
  // children are not applied); pop.
  virtual void drawContentWithOptions(const RenderOptions& options);
  // The layer's own content in object coordinates. The base is a placeholder
  // (a teapot, with a log line) that concrete layers replace.
  virtual void drawGLWithOptions(const RenderOptions& options);
  // Drawn by the traversal between the layer's own content and its
  // children, whether or not the layer is visible (a point layer's box in
  // the editor); the base draws nothing.
  virtual void drawDecorationsWithOptions(const RenderOptions& options);
  // True for a layer whose drawGLWithOptions may hand its points to an
  // off-screen frame's CPU point pass instead of drawing them (and flushes
  // the pass itself before drawing anything through OpenGL). For every
  // other layer the traversal flushes the pass first, so that the frame is
  // composed in the layers' order: a subclass of such a layer that draws
  // through OpenGL in its own way answers false again.
  virtual bool mayDrawIntoPointPass() const { return false; }

  // The move/rotate gizmo: points at the origin and at `size` along each
  // axis, and a circle of radius `size` in each coordinate plane.
  static void drawTrackballWithSize(float size);
  // Draws what the options' CPU point pass holds, if any, unless `layer`
  // may hand its own points to the pass.
  static void flushPointPassBefore(const Layer& layer, const RenderOptions& options);
  // Red, green and blue lines of length `size` along x, y and z.
  static void drawAxesWithSize(float size);

  // Written after the base keys: "layerName", "isVisible", "animate",
  // "animationPath", "isInWorld", "billboardDistance", "enableFog",
  // "bbox00".."bbox05" (doubles), "childLayers". Read back with the box as
  // floats (a box survives a reload only to float precision) and the
  // billboard distance stored unclamped.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  void copyInto(Animatable3DObject& target) const override;

  // For the layer kinds' own undoable keys; a null document does nothing.
  void addUndoObservers(MyDocument* document, std::span<const UndoableKey> keys);
  void removeUndoObservers(MyDocument* document, std::span<const UndoableKey> keys);

 private:
  std::string name_;
  std::vector<std::shared_ptr<Layer>> childLayers_;
  bool isVisible_ = true;
  bool isInWorld_ = true;
  bool animate_ = false;
  std::int32_t animationPath_ = 0;
  float billboardDistance_ = 1.0f;
  BoundingBox bbox_{};
  bool enableFog_ = false;
  bool displayListInvalid_ = false;
  bool isModified_ = false;
};

// A layer with a frame-based animation of its own.
class AnimatedLayer : public Layer {
 public:
  AnimatedLayer() = default;

  std::string_view className() const override { return "AnimatedLayer"; }
  const PropertyTable& properties() const override;

  std::int32_t nFrames() const { return nFrames_; }
  std::int32_t FPS() const { return FPS_; }
  void setNFrames(std::int32_t v) { changeValueForKey("nFrames", nFrames_, v); }
  void setFPS(std::int32_t v) { changeValueForKey("FPS", FPS_, v); }
  // nFrames / FPS in floats; an FPS of 0 gives an infinity or not-a-number,
  // which is IEEE arithmetic and kept.
  float durationInSeconds() const {
    return static_cast<float>(nFrames_) / static_cast<float>(FPS_);
  }
  // The layer's tracks, then a "Time" track driving the frame through
  // setFrameForTime (subclasses provide the "frame" property).
  void getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) override;

  // "nFrames" and "FPS" after the layer keys; a missing "FPS" reads as 0.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  void copyInto(Animatable3DObject& target) const override;

 private:
  std::int32_t nFrames_ = 0;
  std::int32_t FPS_ = 25;
};

}  // namespace cloudreel
