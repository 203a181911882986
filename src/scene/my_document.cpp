#include "scene/my_document.h"

#include <algorithm>
#include <typeinfo>

#include "camera/camera_path.h"
#include "camera/discrete_camera_path.h"
#include "camera/scene_camera.h"
#include "camera/transform_stack.h"
#include "platform/log.h"
#include "platform/run_loop.h"
#include "render/gl/egl_context.h"
#include "render/render_options.h"
#include "scene/layer.h"
#include "scene/light_source.h"
#include "timeline/timeline.h"

namespace cloudreel {

namespace {

// Depth first, parent before children. `ancestors` holds the layers above
// `layer` on the way down; meeting one of them again means the tree loops
// back on itself there, and that branch is not entered a second time.
void gatherCameraPaths(const std::shared_ptr<Layer>& layer,
                       std::vector<std::shared_ptr<CameraPath>>& paths,
                       std::vector<const Layer*>& ancestors) {
  if (!layer || std::find(ancestors.begin(), ancestors.end(), layer.get()) != ancestors.end()) {
    return;
  }
  if (auto path = std::dynamic_pointer_cast<CameraPath>(layer)) {
    paths.push_back(std::move(path));
  }
  ancestors.push_back(layer.get());
  for (const auto& child : layer->childLayers()) {
    gatherCameraPaths(child, paths, ancestors);
  }
  ancestors.pop_back();
}

ApplicationDelegate* sharedDelegate = nullptr;

}  // namespace

ApplicationDelegate* ApplicationDelegate::shared() { return sharedDelegate; }
void ApplicationDelegate::setShared(ApplicationDelegate* delegate) { sharedDelegate = delegate; }

MyDocument::MyDocument()
    : sceneCamera_(SceneCamera::initWithZDistance(15.0)),
      lightSource_(std::make_shared<LightSource>()),
      undoManager_(&RunLoop::main()) {
  sceneCamera_->setName("Scene Camera");
  setTimeline(std::make_shared<Timeline>());
  initOpenGLContext();
  transformStacks_.push_back(std::make_shared<TransformStack>());
  NotificationCenter::defaultCenter().addObserver(
      *this, std::string(kGridColorChangedNotification), nullptr,
      [this](const Notification& n) { handleGridColorChange(n); });
}

MyDocument::~MyDocument() {
  NotificationCenter::defaultCenter().removeObserver(*this);
  for (const auto& layer : layers_) {
    layer->removeObserversForDocument(this);
  }
  if (timeline_) {
    timeline_->setUndoManager(nullptr);
  }
}

void MyDocument::close() {
  NotificationCenter::defaultCenter().postNotificationName(std::string(kDocumentCloseNotification),
                                                           this);
}

const PropertyTable& MyDocument::properties() const {
  static const PropertyTable table(
      &Object::objectProperties(),
      {property<MyDocument>("sceneCamera", &MyDocument::sceneCamera, &MyDocument::setSceneCamera),
       property<MyDocument>("lightSource", &MyDocument::lightSource, &MyDocument::setLightSource),
       property<MyDocument>("selectedLayer", &MyDocument::selectedLayer,
                            &MyDocument::setSelectedLayer),
       property<MyDocument>("selectedCamera", &MyDocument::selectedCamera,
                            &MyDocument::setSelectedCamera),
       property<MyDocument>("enableViewUpdates", &MyDocument::enableViewUpdates,
                            &MyDocument::setEnableViewUpdates),
       property<MyDocument>("timeline", &MyDocument::timeline, &MyDocument::setTimeline),
       // Boxed: null stands for a setting the file did not hold.
       Property{"overrideBuckets",
                [](const Object& o) -> Value {
                  const auto v = static_cast<const MyDocument&>(o).overrideBuckets();
                  return v ? Value(*v) : Value{};
                },
                [](Object& o, const Value& v) {
                  if (!isNull(v) && !isNumber(v)) {
                    return false;
                  }
                  static_cast<MyDocument&>(o).setOverrideBuckets(numberAs<bool>(v));
                  return true;
                }},
       Property{"bucketOverrideFraction",
                [](const Object& o) -> Value {
                  const auto v = static_cast<const MyDocument&>(o).bucketOverrideFraction();
                  return v ? Value(*v) : Value{};
                },
                [](Object& o, const Value& v) {
                  if (!isNull(v) && !isNumber(v)) {
                    return false;
                  }
                  static_cast<MyDocument&>(o).setBucketOverrideFraction(numberAs<float>(v));
                  return true;
                }}});
  return table;
}

// --- change reporting

void MyDocument::hasChanged() {
  redrawViews();
  NotificationCenter::defaultCenter().postNotificationName(std::string(kDocumentChangeNotification),
                                                           this);
}

void MyDocument::redrawViews() {
  if (!enableViewUpdates_) {
    return;
  }
  if (playbackView_ != nullptr) {
    playbackView_->setNeedsDisplay();
    return;
  }
  // A copy: a view may remove itself while redrawing.
  const std::vector<DocumentView*> views = views_;
  for (DocumentView* view : views) {
    view->setNeedsDisplay();
  }
}

void MyDocument::handleGridColorChange(const Notification&) { hasChanged(); }

void MyDocument::addView(DocumentView& view) {
  if (std::find(views_.begin(), views_.end(), &view) == views_.end()) {
    views_.push_back(&view);
  }
}

void MyDocument::removeView(DocumentView& view) {
  std::erase(views_, &view);
  if (playbackView_ == &view) {
    playbackView_ = nullptr;
  }
}

void MyDocument::reloadOutline() {
  if (outlineView_ != nullptr) {
    outlineView_->reloadData();
  }
}

// --- the layers

void MyDocument::setLayers(std::vector<std::shared_ptr<Layer>> layers) {
  changeValueForKey("layers", layers_, std::move(layers));
}

void MyDocument::insertObjectInLayersAtIndex(std::shared_ptr<Layer> layer, int index) {
  if (!layer || index < 0 || static_cast<std::size_t>(index) > layers_.size()) {
    logf("insertObject:inLayersAtIndex: index %d is outside 0...%d; nothing inserted", index,
         static_cast<int>(layers_.size()));
    return;
  }
  undoManager_.registerUndoWithTarget(this,
                                      [this, index] { removeObjectFromLayersAtIndex(index); });
  if (!undoManager_.isUndoing()) {
    undoManager_.setActionName("New Layer");
  }
  layer->addObserversForDocument(this);
  layers_.insert(layers_.begin() + index, std::move(layer));
  hasChanged();
  reloadOutline();
}

void MyDocument::removeObjectFromLayersAtIndex(int index) {
  if (index < 0 || static_cast<std::size_t>(index) >= layers_.size()) {
    logf("removeObjectFromLayersAtIndex: index %d is outside the %d layers; nothing removed", index,
         static_cast<int>(layers_.size()));
    return;
  }
  const std::shared_ptr<Layer> layer = layers_[static_cast<std::size_t>(index)];
  undoManager_.registerUndoWithTarget(
      this, [this, layer, index] { insertObjectInLayersAtIndex(layer, index); });
  if (!undoManager_.isUndoing()) {
    undoManager_.setActionName("Remove Layer");
  }
  layer->removeObserversForDocument(this);
  layers_.erase(layers_.begin() + index);
  hasChanged();
  reloadOutline();
}

void MyDocument::addLayer(std::shared_ptr<Layer> layer) {
  if (!layer) {
    return;
  }
  willChangeValueForKey("layers");
  insertObjectInLayersAtIndex(layer, static_cast<int>(layers_.size()));
  didChangeValueForKey("layers");
  setSelectedLayer(layer);
}

// --- camera paths and transform stacks

void MyDocument::setCameraPaths(std::vector<std::shared_ptr<CameraPath>> paths) {
  changeValueForKey("cameraPaths", cameraPaths_, std::move(paths));
}

void MyDocument::insertObjectInCameraPathsAtIndex(std::shared_ptr<CameraPath> path, int index) {
  if (!path || index < 0 || static_cast<std::size_t>(index) > cameraPaths_.size()) {
    logf("insertObject:inCameraPathsAtIndex: index %d is outside 0...%d; nothing inserted", index,
         static_cast<int>(cameraPaths_.size()));
    return;
  }
  undoManager_.registerUndoWithTarget(this,
                                      [this, index] { removeObjectFromCameraPathsAtIndex(index); });
  if (!undoManager_.isUndoing()) {
    undoManager_.setActionName("New Camera Path");
  }
  cameraPaths_.insert(cameraPaths_.begin() + index, std::move(path));
  hasChanged();
}

void MyDocument::removeObjectFromCameraPathsAtIndex(int index) {
  if (index < 0 || static_cast<std::size_t>(index) >= cameraPaths_.size()) {
    logf(
        "removeObjectFromCameraPathsAtIndex: index %d is outside the %d camera paths; nothing "
        "removed",
        index, static_cast<int>(cameraPaths_.size()));
    return;
  }
  const std::shared_ptr<CameraPath> path = cameraPaths_[static_cast<std::size_t>(index)];
  undoManager_.registerUndoWithTarget(
      this, [this, path, index] { insertObjectInCameraPathsAtIndex(path, index); });
  if (!undoManager_.isUndoing()) {
    undoManager_.setActionName("Remove Camera Path");
  }
  cameraPaths_.erase(cameraPaths_.begin() + index);
  hasChanged();
}

void MyDocument::addCameraPath(std::shared_ptr<CameraPath> path) {
  willChangeValueForKey("cameraPaths");
  insertObjectInCameraPathsAtIndex(std::move(path), static_cast<int>(cameraPaths_.size()));
  didChangeValueForKey("cameraPaths");
}

void MyDocument::addCameraPathsForLayer(const std::shared_ptr<Layer>& layer,
                                        std::vector<std::shared_ptr<CameraPath>>& paths) {
  std::vector<const Layer*> ancestors;
  gatherCameraPaths(layer, paths, ancestors);
}

std::vector<std::shared_ptr<CameraPath>> MyDocument::cameraPaths() const {
  std::vector<std::shared_ptr<CameraPath>> paths;
  for (const auto& layer : layers_) {
    addCameraPathsForLayer(layer, paths);
  }
  return paths;
}

std::vector<std::shared_ptr<DiscreteCameraPath>> MyDocument::discretePaths() const {
  std::vector<std::shared_ptr<DiscreteCameraPath>> paths;
  for (const auto& layer : layers_) {
    if (const Layer* top = layer.get();
        top != nullptr && typeid(*top) == typeid(DiscreteCameraPath)) {
      paths.push_back(std::static_pointer_cast<DiscreteCameraPath>(layer));
    }
  }
  return paths;
}

void MyDocument::setTransformStacks(std::vector<std::shared_ptr<TransformStack>> stacks) {
  changeValueForKey("transformStacks", transformStacks_, std::move(stacks));
}

// --- selection

void MyDocument::setSelectedLayer(const std::shared_ptr<Layer>& layer) {
  if (const auto old = selectedLayer_.lock()) {
    old->sendDeselectNotification();
  }
  willChangeValueForKey("selectedLayer");
  selectedLayer_ = layer;
  didChangeValueForKey("selectedLayer");
  if (layer) {
    layer->sendSelectNotification();
  }
  hasChanged();
}

void MyDocument::setSelectedCamera(const std::shared_ptr<Camera>& camera) {
  willChangeValueForKey("selectedCamera");
  selectedCamera_ = camera;
  didChangeValueForKey("selectedCamera");
}

void MyDocument::setSceneCamera(std::shared_ptr<SceneCamera> camera) {
  changeValueForKey("sceneCamera", sceneCamera_, std::move(camera));
}

void MyDocument::setLightSource(std::shared_ptr<LightSource> light) {
  changeValueForKey("lightSource", lightSource_, std::move(light));
}

void MyDocument::setTimeline(std::shared_ptr<Timeline> timeline) {
  if (timeline_) {
    timeline_->setUndoManager(nullptr);
  }
  if (timeline) {
    timeline->setUndoManager(&undoManager_);
  }
  changeValueForKey("timeline", timeline_, std::move(timeline));
}

void MyDocument::setViewBookmarks(std::optional<Bookmarks> bookmarks) {
  willChangeValueForKey("viewBookmarks");
  viewBookmarks_ = std::move(bookmarks);
  didChangeValueForKey("viewBookmarks");
}

void MyDocument::setOverrideBuckets(std::optional<bool> v) {
  willChangeValueForKey("overrideBuckets");
  overrideBuckets_ = v;
  didChangeValueForKey("overrideBuckets");
}

void MyDocument::setBucketOverrideFraction(std::optional<float> v) {
  willChangeValueForKey("bucketOverrideFraction");
  bucketOverrideFraction_ = v;
  didChangeValueForKey("bucketOverrideFraction");
}

// --- drawing

void MyDocument::drawContentWithOptions(const RenderOptions& options) {
  lightSource_->setupLightSource();
  lightSource_->drawContentWithOptions(options);
  // Copies: drawing must not see the lists change under it.
  const std::vector<std::shared_ptr<Layer>> layers = layers_;
  for (const auto& layer : layers) {
    layer->drawContentWithOptions(options);
  }
  if (options.isYes(kRenderOptionEditor)) {
    const std::vector<std::shared_ptr<TransformStack>> stacks = transformStacks_;
    for (const auto& stack : stacks) {
      stack->drawContentWithOptions(options);
    }
  }
}

std::shared_ptr<gl::GLContext> MyDocument::sharedGLContext() {
  if (!sharedGLContext_ && contextWanted_) {
    contextWanted_ = false;
    // A headless context draws only into framebuffer objects, which carry
    // their own 32-bit depth buffers, so the context itself asks for no
    // pixel format.
    Error error;
    sharedGLContext_ = gl::EglContext::createHeadless(&error);
    if (!sharedGLContext_) {
      logWarningf("cannot make the document's OpenGL context: %s", error.message);
    }
  }
  return sharedGLContext_;
}

void MyDocument::setSharedGLContext(std::shared_ptr<gl::GLContext> context) {
  sharedGLContext_ = std::move(context);
  contextWanted_ = false;
}

void MyDocument::initOpenGLContext() {
  sharedGLContext_.reset();
  contextWanted_ = true;
}

// --- generic undoable property changes

void MyDocument::observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath,
                                                             Object& object, const Change& change,
                                                             std::string_view context) {
  // The step holds the object, as it holds the old value.
  const ObjectPtr target = object.weak_from_this().lock();
  if (!target) {
    logf("%s is not shared-owned; its change of \"%s\" cannot be undone",
         std::string(object.className()), std::string(keyPath));
    return;
  }
  undoManager_.registerUndoWithTarget(
      this, [this, path = std::string(keyPath), target, old = change.oldValue.value_or(Value{})] {
        changeKeyPathOfObjectToValue(path, *target, old);
      });
  undoManager_.setActionName(std::string(context));
}

void MyDocument::changeKeyPathOfObjectToValue(std::string_view keyPath, Object& object,
                                              const Value& value) {
  object.setValueForKeyPath(value, keyPath);
  hasChanged();
}

// --- the layer outline's data source

int MyDocument::outlineViewNumberOfChildrenOfItem(const Layer* item) const {
  return item == nullptr ? static_cast<int>(layers_.size()) : item->childLayerCount();
}

bool MyDocument::outlineViewIsItemExpandable(const Layer* item) const {
  return (outlineViewNumberOfChildrenOfItem(item) & 0xff) != 0;
}

std::shared_ptr<Layer> MyDocument::outlineViewChildOfItem(int index, const Layer* item) const {
  const auto& children = item == nullptr ? layers_ : item->childLayers();
  if (index < 0 || static_cast<std::size_t>(index) >= children.size()) {
    return nullptr;
  }
  return children[static_cast<std::size_t>(index)];
}

Value MyDocument::outlineViewObjectValueForTableColumnByItem(std::string_view column,
                                                             const Layer* item) const {
  return item != nullptr ? item->valueForKey(column) : Value{};
}

void MyDocument::outlineViewSetObjectValueForTableColumnByItem(const Value& value,
                                                               std::string_view column,
                                                               Layer* item) {
  if (item == nullptr) {
    return;
  }
  item->setValueForKey(value, column);
  hasChanged();
}

}  // namespace cloudreel
