#pragma once
// One open scene: the layer tree, the stored camera paths, the transform
// stacks, the scene camera and light, the undo manager, and the change
// reporting every edit ends in.
//
// Every scene edit ends in hasChanged, which redraws the document's views
// (unless view updates are off) and posts the change notification the
// panels refresh on. Property edits of the layers become undo steps through
// observation: the document observes each top-level layer's undoable keys
// with the undo action name as context, and registers "set the old value
// back" when one changes. Structural edits register their inverse.

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/notification_center.h"
#include "platform/object.h"
#include "platform/undo_manager.h"

namespace cloudreel {

class Camera;
class CameraPath;
class DiscreteCameraPath;
class Layer;
class LightSource;
class SceneCamera;
class Timeline;
class TransformStack;

inline constexpr std::string_view kDocumentChangeNotification =
    "KTPointDocument_DocumentChangeNotification";
inline constexpr std::string_view kGridColorChangedNotification = "KTGridColorChanged";

// A view that shows a document and redraws when told to.
class DocumentView {
 public:
  virtual ~DocumentView() = default;
  virtual void setNeedsDisplay() = 0;
};

// The layer outline that shows the document's tree.
class LayerOutline {
 public:
  virtual ~LayerOutline() = default;
  virtual void reloadData() = 0;
};

class MyDocument : public Object, public Observer {
 public:
  // No layers and no stored camera paths; one new transform stack; a scene
  // camera 15 units along +z named "Scene Camera"; a new light; view
  // updates on.
  MyDocument();
  // Detaches every top-level layer.
  ~MyDocument() override;

  std::string_view className() const override { return "MyDocument"; }
  const PropertyTable& properties() const override;

  UndoManager& undoManager() { return undoManager_; }

  // --- change reporting
  // Redraws the views (only the playback view while one is set) when view
  // updates are on, then posts the change notification in any case.
  void hasChanged();
  void handleGridColorChange(const Notification& notification);
  bool enableViewUpdates() const { return enableViewUpdates_; }
  void setEnableViewUpdates(bool v) {
    changeValueForKey("enableViewUpdates", enableViewUpdates_, v);
  }
  // The views showing this document (not owned; a view removes itself
  // before it goes).
  void addView(DocumentView& view);
  void removeView(DocumentView& view);
  // While playback or a render runs in a window of its own, only its view
  // is redrawn; null ends that.
  void setPlaybackView(DocumentView* view) { playbackView_ = view; }
  void setOutlineView(LayerOutline* outline) { outlineView_ = outline; }

  // --- the layers
  const std::vector<std::shared_ptr<Layer>>& layers() const { return layers_; }
  // A plain store: the layers are neither attached nor detached.
  void setLayers(std::vector<std::shared_ptr<Layer>> layers);
  // Undoable ("New Layer", "Remove Layer"): the layer is attached to the
  // document while it is in the list. An index outside the list (past the
  // end for an insertion) is logged and changes nothing.
  void insertObjectInLayersAtIndex(std::shared_ptr<Layer> layer, int index);
  void removeObjectFromLayersAtIndex(int index);
  // Appends the layer undoably and selects it.
  void addLayer(std::shared_ptr<Layer> layer);

  // --- camera paths and transform stacks
  // The camera paths added with addCameraPath: the list the document file
  // keeps. They need not be in the layer tree, and those in it need not be
  // here.
  const std::vector<std::shared_ptr<CameraPath>>& storedCameraPaths() const { return cameraPaths_; }
  // A plain store.
  void setCameraPaths(std::vector<std::shared_ptr<CameraPath>> paths);
  // Undoable ("New Camera Path", "Remove Camera Path"). Unlike the layer
  // operations these neither attach nor detach the path and leave the
  // outline alone. An index outside the list (past the end for an
  // insertion) is logged and changes nothing.
  void insertObjectInCameraPathsAtIndex(std::shared_ptr<CameraPath> path, int index);
  void removeObjectFromCameraPathsAtIndex(int index);
  // Appends to the stored list undoably, announced as a change of
  // "cameraPaths".
  void addCameraPath(std::shared_ptr<CameraPath> path);
  // Not the stored list: a new list of every camera path in the layer tree,
  // of any kind, depth first with each parent before its children.
  std::vector<std::shared_ptr<CameraPath>> cameraPaths() const;
  // Appends `layer` when it is a camera path, then the paths of its
  // children in order. A layer found again below itself (a tree made into
  // a loop) is not walked a second time, so the walk always ends.
  static void addCameraPathsForLayer(const std::shared_ptr<Layer>& layer,
                                     std::vector<std::shared_ptr<CameraPath>>& paths);
  // The top-level layers whose class is exactly DiscreteCameraPath: its
  // subclasses and nested paths do not count.
  std::vector<std::shared_ptr<DiscreteCameraPath>> discretePaths() const;
  const std::vector<std::shared_ptr<TransformStack>>& transformStacks() const {
    return transformStacks_;
  }
  // A plain store.
  void setTransformStacks(std::vector<std::shared_ptr<TransformStack>> stacks);

  // --- the animation: a new document's timeline holds the ruler alone.
  const std::shared_ptr<Timeline>& timeline() const { return timeline_; }

  // --- selection (not owned)
  std::shared_ptr<Layer> selectedLayer() const { return selectedLayer_.lock(); }
  // Tells the old layer it is deselected and the new one it is selected.
  void setSelectedLayer(const std::shared_ptr<Layer>& layer);
  std::shared_ptr<Camera> selectedCamera() const { return selectedCamera_.lock(); }
  void setSelectedCamera(const std::shared_ptr<Camera>& camera);

  // --- scene camera and light
  const std::shared_ptr<SceneCamera>& sceneCamera() const { return sceneCamera_; }
  void setSceneCamera(std::shared_ptr<SceneCamera> camera);
  const std::shared_ptr<LightSource>& lightSource() const { return lightSource_; }
  void setLightSource(std::shared_ptr<LightSource> light);

  // --- generic undoable property changes
  // Registers the old value of an observed property as an undo step named
  // by the observation context.
  void observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath, Object& object,
                                                   const Change& change,
                                                   std::string_view context) override;
  // The undo action of such a change: sets the value by key path, then
  // hasChanged. Run as an undo, the change is observed again and becomes
  // the redo.
  void changeKeyPathOfObjectToValue(std::string_view keyPath, Object& object, const Value& value);

  // --- the layer outline's data source; a null item is the root
  int outlineViewNumberOfChildrenOfItem(const Layer* item) const;
  // The low eight bits of the child count as a flag: an item with exactly
  // 256 children reports itself as not expandable, as the outline always
  // has.
  bool outlineViewIsItemExpandable(const Layer* item) const;
  // Null for an index outside the item's children.
  std::shared_ptr<Layer> outlineViewChildOfItem(int index, const Layer* item) const;
  // The item's value for the key the column is identified by.
  Value outlineViewObjectValueForTableColumnByItem(std::string_view column,
                                                   const Layer* item) const;
  // Sets it (undoable through the layer's observation), then hasChanged.
  void outlineViewSetObjectValueForTableColumnByItem(const Value& value, std::string_view column,
                                                     Layer* item);

 private:
  void reloadOutline();

  std::vector<std::shared_ptr<Layer>> layers_;
  std::vector<std::shared_ptr<CameraPath>> cameraPaths_;
  std::vector<std::shared_ptr<TransformStack>> transformStacks_;
  std::shared_ptr<Timeline> timeline_;
  std::shared_ptr<SceneCamera> sceneCamera_;
  std::weak_ptr<Layer> selectedLayer_;
  std::weak_ptr<Camera> selectedCamera_;
  std::shared_ptr<LightSource> lightSource_;
  std::vector<DocumentView*> views_;
  DocumentView* playbackView_ = nullptr;
  LayerOutline* outlineView_ = nullptr;
  bool enableViewUpdates_ = true;
  UndoManager undoManager_;
};

}  // namespace cloudreel
