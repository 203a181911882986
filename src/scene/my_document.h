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

#include <filesystem>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "platform/byte_stream.h"
#include "platform/error.h"
#include "platform/notification_center.h"
#include "platform/object.h"
#include "platform/undo_manager.h"

namespace cloudreel {

namespace gl {
class GLContext;
}
class InputStream;
class OutputStream;
class RenderOptions;

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
inline constexpr std::string_view kDocumentCloseNotification =
    "KTPointDocument_DocumentCloseNotification";
inline constexpr std::string_view kGridColorChangedNotification = "KTGridColorChanged";

// The document file's extension.
inline constexpr std::string_view kDocumentExtension = "reel";
// A document that cannot be read: the operating system's status domain and
// its code for corrupt data, with the reason "The document is corrupt".
inline constexpr std::string_view kDocumentErrorDomain = "NSOSStatusErrorDomain";
inline constexpr int kDocumentCorruptCode = -4;
inline constexpr std::string_view kDocumentCorruptMessage = "The document is corrupt";

// The application object a document tells which layer became current (the
// one a new or opened document starts with). The application installs one;
// without it nobody is told.
class ApplicationDelegate {
 public:
  virtual ~ApplicationDelegate() = default;
  virtual void setCurrentLayer(const std::shared_ptr<Layer>& layer) = 0;

  static ApplicationDelegate* shared();
  // Not owned; null removes it.
  static void setShared(ApplicationDelegate* delegate);
};

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
  // updates on; bucket override on at 0.1.
  MyDocument();
  // Detaches every top-level layer and stops receiving notifications.
  ~MyDocument() override;

  std::string_view className() const override { return "MyDocument"; }
  const PropertyTable& properties() const override;

  UndoManager& undoManager() { return undoManager_; }

  // --- change reporting
  // Redraws the views (only the playback view while one is set) when view
  // updates are on, then posts the change notification in any case.
  void hasChanged();
  // Only the redraw half of hasChanged: for what changes the picture but
  // not the document (a picture that finished decoding).
  void redrawViews();
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

  // --- the animation: a new document's timeline holds the ruler alone. A
  // document read from a file without one has none (null). Applying the
  // timeline registers no undo: animation is not an edit.
  const std::shared_ptr<Timeline>& timeline() const { return timeline_; }
  void setTimeline(std::shared_ptr<Timeline> timeline);

  // --- view bookmarks: copies of the scene camera under the bookmark menu
  // item's title. Null in a document read from a file without them; every
  // user treats null as empty.
  using Bookmarks = std::map<std::string, std::shared_ptr<SceneCamera>>;
  const std::optional<Bookmarks>& viewBookmarks() const { return viewBookmarks_; }
  void setViewBookmarks(std::optional<Bookmarks> bookmarks);

  // --- the document-wide bucket settings, boxed as the file holds them:
  // null in files written before they existed, which means no override and
  // a fraction of 0.0 wherever they are used.
  std::optional<bool> overrideBuckets() const { return overrideBuckets_; }
  void setOverrideBuckets(std::optional<bool> v);
  std::optional<float> bucketOverrideFraction() const { return bucketOverrideFraction_; }
  void setBucketOverrideFraction(std::optional<float> v);

  // --- drawing
  // The scene's root: the light, every top-level layer (each decides by its
  // own visibility), and in editor frames only the transform stacks.
  void drawContentWithOptions(const RenderOptions& options);
  // The context every view and off-screen renderer of this document shares.
  // initOpenGLContext replaces it with a new headless one (a context in a
  // share group of its own), made when first asked for, so a document that
  // is never drawn never starts a GL driver. A front end with contexts of
  // its own hands one in with setSharedGLContext. Null when no context can
  // be had (logged).
  std::shared_ptr<gl::GLContext> sharedGLContext();
  void setSharedGLContext(std::shared_ptr<gl::GLContext> context);
  void initOpenGLContext();

  // --- the document file
  // Posts the close notification; the front end then closes the windows.
  void close();
  // The archive of the whole scene (the type is not consulted). Modified
  // top-level point layers linked to a point file write it back first; a
  // failure there is presented by the layer and does not stop the save.
  // Empty, with the error, only when the archive itself cannot be made.
  Bytes dataOfTypeError(std::string_view type, Error* error);
  // Replaces the document's contents by those of the archive. Bytes that are
  // not a document give NO and "The document is corrupt" (code -4); a
  // linked point file that cannot be found gives NO and the point file's
  // error naming the file. Either way nothing of the document changes.
  bool readFromDataOfTypeError(std::span<const std::uint8_t> data, std::string_view type,
                               Error* error);
  // The same from and to a file on disk. Writing streams the archive into a
  // temporary beside the file, flushes it to the disk and renames it over
  // the file (through a symbolic link, onto the file it names), so a save
  // that fails for any reason reports why and leaves the previous file as it
  // was. Point records go between the layers' arrays and the file with no
  // copy of the whole archive in memory.
  bool writeToURLError(const std::filesystem::path& url, Error* error);
  bool readFromURLError(const std::filesystem::path& url, Error* error);

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
  bool writeToStream(OutputStream& out, Error* error);
  bool readFromStream(InputStream& in, Error* error);

  std::vector<std::shared_ptr<Layer>> layers_;
  std::vector<std::shared_ptr<CameraPath>> cameraPaths_;
  std::vector<std::shared_ptr<TransformStack>> transformStacks_;
  std::shared_ptr<Timeline> timeline_;
  std::shared_ptr<SceneCamera> sceneCamera_;
  std::weak_ptr<Layer> selectedLayer_;
  std::weak_ptr<Camera> selectedCamera_;
  std::shared_ptr<LightSource> lightSource_;
  std::optional<Bookmarks> viewBookmarks_ = Bookmarks{};
  std::optional<bool> overrideBuckets_ = true;
  std::optional<float> bucketOverrideFraction_ = 0.1f;
  std::shared_ptr<gl::GLContext> sharedGLContext_;
  bool contextWanted_ = false;
  std::vector<DocumentView*> views_;
  DocumentView* playbackView_ = nullptr;
  LayerOutline* outlineView_ = nullptr;
  bool enableViewUpdates_ = true;
  UndoManager undoManager_;
};

}  // namespace cloudreel
