#include "scene/layer.h"

#include <epoxy/gl.h>
#include <fmt/printf.h>

#include <cmath>

#include "camera/camera.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "platform/notification_center.h"
#include "render/cpu_point_pass.h"
#include "render/gl/shapes.h"
#include "render/render_options.h"
#include "scene/my_document.h"
#include "timeline/affine_track.h"

namespace cloudreel {

namespace {

std::string bboxKey(int i) { return fmt::sprintf("bbox%02d", i); }

}  // namespace

const PropertyTable& Layer::properties() const {
  static const PropertyTable table(
      &Animatable3DObject::properties(),
      {property<Layer>("name", &Layer::name, &Layer::setName),
       property<Layer>("isVisible", &Layer::isVisible, &Layer::setIsVisible),
       property<Layer>("isInWorld", &Layer::isInWorld, &Layer::setIsInWorld),
       property<Layer>("animate", &Layer::animate, &Layer::setAnimate),
       property<Layer>("animationPath", &Layer::animationPath, &Layer::setAnimationPath),
       property<Layer>("billboardDistance", &Layer::billboardDistance,
                       &Layer::setBillboardDistance),
       property<Layer>("enableFog", &Layer::enableFog, &Layer::setEnableFog),
       property<Layer>("displayListInvalid", &Layer::displayListInvalid,
                       &Layer::setDisplayListInvalid),
       property<Layer>("isModified", &Layer::isModified, &Layer::setIsModified),
       readOnlyProperty<Layer>("childLayerCount", &Layer::childLayerCount)});
  return table;
}

std::shared_ptr<Animatable3DObject> Layer::makeBlank() const { return std::make_shared<Layer>(); }

void Layer::copyInto(Animatable3DObject& target) const {
  Animatable3DObject::copyInto(target);
  auto& copy = static_cast<Layer&>(target);
  copy.setName(name_.empty() ? std::string() : name_ + " copy");
  copy.setIsVisible(isVisible_);
  copy.setIsInWorld(isInWorld_);
  // The same children, not copies of them.
  copy.setChildLayers(childLayers_);
  copy.setBillboardDistance(billboardDistance_);
  copy.setAnimate(animate_);
  copy.setAnimationPath(animationPath_);
  copy.setBoundingBoxWithMinXMaxXMinYMaxYMinZMaxZ(narrowToFloat(bbox_[0]), narrowToFloat(bbox_[3]),
                                                  narrowToFloat(bbox_[1]), narrowToFloat(bbox_[4]),
                                                  narrowToFloat(bbox_[2]), narrowToFloat(bbox_[5]));
  copy.setEnableFog(enableFog_);
}

void Layer::setChildLayers(std::vector<std::shared_ptr<Layer>> v) {
  changeValueForKey("childLayers", childLayers_, std::move(v));
}

void Layer::setBillboardDistance(float v) {
  // NaN fails the comparison and so becomes 0 as well.
  changeValueForKey("billboardDistance", billboardDistance_, v >= 0.0f ? v : 0.0f);
}

void Layer::setBoundingBoxWithMinXMaxXMinYMaxYMinZMaxZ(float minX, float maxX, float minY,
                                                       float maxY, float minZ, float maxZ) {
  bbox_ = {minX, minY, minZ, maxX, maxY, maxZ};
}

void Layer::addChildLayer(std::shared_ptr<Layer> child) {
  willChangeValueForKey("childLayers");
  childLayers_.push_back(std::move(child));
  didChangeValueForKey("childLayers");
}

void Layer::setFrameForTime(float) {}

void Layer::getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) {
  tracks.push_back(std::make_shared<AffineTrack>(weak_from_this().lock(), "Transform"));
}

void Layer::multiplyTransformByQuaternion(const std::array<double, 4>&) {}

void Layer::postNotification(std::string_view name) const {
  NotificationCenter::defaultCenter().postNotificationName(std::string(name), this);
}

void Layer::addObserversForDocument(MyDocument* document) {
  Animatable3DObject::addObserversForDocument(document);
  if (document != nullptr) {
    addObserver(*document, "name", ObservingOptions::Old, "Change Name");
    addObserver(*document, "isVisible", ObservingOptions::Old, "Layer Visibility");
  }
}

void Layer::removeObserversForDocument(MyDocument* document) {
  Animatable3DObject::removeObserversForDocument(document);
  if (document != nullptr) {
    removeObserver(*document, "name");
    removeObserver(*document, "isVisible");
  }
}

void Layer::addUndoObservers(MyDocument* document, std::span<const UndoableKey> keys) {
  if (document != nullptr) {
    for (const UndoableKey& k : keys) {
      addObserver(*document, std::string(k.key), ObservingOptions::Old, std::string(k.actionName));
    }
  }
}

void Layer::removeUndoObservers(MyDocument* document, std::span<const UndoableKey> keys) {
  if (document != nullptr) {
    for (const UndoableKey& k : keys) {
      removeObserver(*document, k.key);
    }
  }
}

void Layer::drawContentWithOptions(const RenderOptions& options) {
  glPushMatrix();
  if (isInWorld_) {
    // Without a scene camera in the options the matrix stays as it is.
    if (const auto camera = options.sceneCamera()) {
      camera->setOrientation();
    }
  } else {
    glTranslatef(0.0f, 0.0f, -billboardDistance_);
  }
  transformObjectToWorld();
  if (isEditing() && options.isYes(kRenderOptionEditor)) {
    drawTrackballWithSize(1.0f);
  }
  transformInertialToObject();
  if (isVisible_) {
    flushPointPassBefore(*this, options);
    drawGLWithOptions(options);
  }
  flushPointPassBefore(*this, options);
  drawDecorationsWithOptions(options);
  // A copy of the list: drawing may not change the tree under the loop.
  const std::vector<std::shared_ptr<Layer>> children = childLayers_;
  for (const auto& child : children) {
    if (child && child->isVisible()) {
      flushPointPassBefore(*child, options);
      child->drawGLWithOptions(options);
    }
  }
  popTransformation();
}

void Layer::flushPointPassBefore(const Layer& layer, const RenderOptions& options) {
  if (CpuPointPass* pass = options.cpuPointPass();
      pass != nullptr && !layer.mayDrawIntoPointPass()) {
    pass->flush();
  }
}

void Layer::drawDecorationsWithOptions(const RenderOptions&) {}

void Layer::drawGLWithOptions(const RenderOptions&) {
  logf("defult drawGL!");
  gl::drawSolidTeapot(1.0);
}

void Layer::drawTrackballWithSize(float size) {
  glDisable(GL_LIGHTING);
  glPointSize(3.0f);
  glBegin(GL_POINTS);
  glColor3f(0.0f, 0.0f, 0.0f);
  glVertex3f(0.0f, 0.0f, 0.0f);
  glColor3f(1.0f, 0.0f, 0.0f);
  glVertex3f(size, 0.0f, 0.0f);
  glColor3f(0.0f, 1.0f, 0.0f);
  glVertex3f(0.0f, size, 0.0f);
  glColor3f(0.0f, 0.0f, 1.0f);
  glVertex3f(0.0f, 0.0f, size);
  glEnd();
  // One step past a full turn, so that each circle closes. Each circle takes
  // the colour of the axis it turns about.
  constexpr double kEnd = 6.383185307179586;
  const auto circle = [size](float r, float g, float b, auto vertex) {
    glColor3f(r, g, b);
    glBegin(GL_LINE_STRIP);
    for (double a = 0.0; a < kEnd; a += 0.1) {
      vertex(size * std::cos(a), size * std::sin(a));
    }
    glEnd();
  };
  circle(0.0f, 0.0f, 1.0f, [](double u, double v) { glVertex3d(u, v, 0.0); });
  circle(1.0f, 0.0f, 0.0f, [](double u, double v) { glVertex3d(0.0, u, v); });
  circle(0.0f, 1.0f, 0.0f, [](double u, double v) { glVertex3d(v, 0.0, u); });
}

void Layer::drawAxesWithSize(float size) {
  glDisable(GL_LIGHTING);
  glLineWidth(2.0f);
  glBegin(GL_LINES);
  glColor3f(1.0f, 0.0f, 0.0f);
  glVertex3f(0.0f, 0.0f, 0.0f);
  glVertex3f(size, 0.0f, 0.0f);
  glColor3f(0.0f, 1.0f, 0.0f);
  glVertex3f(0.0f, 0.0f, 0.0f);
  glVertex3f(0.0f, size, 0.0f);
  glColor3f(0.0f, 0.0f, 1.0f);
  glVertex3f(0.0f, 0.0f, 0.0f);
  glVertex3f(0.0f, 0.0f, size);
  glEnd();
  glLineWidth(1.0f);
}

void Layer::encodeWithCoder(KeyedArchiver& coder) const {
  Animatable3DObject::encodeWithCoder(coder);
  if (name_.empty()) {
    coder.encodeObject(nullptr, "layerName");
  } else {
    coder.encodeString(name_, "layerName");
  }
  coder.encodeBool(isVisible_, "isVisible");
  coder.encodeBool(animate_, "animate");
  coder.encodeInt32(animationPath_, "animationPath");
  coder.encodeBool(isInWorld_, "isInWorld");
  coder.encodeFloat(billboardDistance_, "billboardDistance");
  coder.encodeBool(enableFog_, "enableFog");
  for (int i = 0; i < 6; ++i) {
    coder.encodeDouble(bbox_[static_cast<std::size_t>(i)], bboxKey(i));
  }
  coder.encodeList(childLayers_, "childLayers");
}

void Layer::initWithCoder(KeyedUnarchiver& coder) {
  Animatable3DObject::initWithCoder(coder);
  name_ = coder.decodeStringForKey("layerName");
  for (int i = 0; i < 6; ++i) {
    bbox_[static_cast<std::size_t>(i)] = coder.decodeFloatForKey(bboxKey(i));
  }
  isVisible_ = coder.decodeBoolForKey("isVisible");
  // A missing list reads as an empty one.
  childLayers_ = coder.decodeListOfClassForKey<Layer>("childLayers")
                     .value_or(std::vector<std::shared_ptr<Layer>>{});
  animate_ = coder.decodeBoolForKey("animate");
  animationPath_ = coder.decodeInt32ForKey("animationPath");
  isInWorld_ = coder.decodeBoolForKey("isInWorld");
  billboardDistance_ = coder.decodeFloatForKey("billboardDistance");
  enableFog_ = coder.decodeBoolForKey("enableFog");
  displayListInvalid_ = false;
  isModified_ = false;
}

// --- AnimatedLayer

const PropertyTable& AnimatedLayer::properties() const {
  static const PropertyTable table(
      &Layer::properties(),
      {property<AnimatedLayer>("nFrames", &AnimatedLayer::nFrames, &AnimatedLayer::setNFrames),
       property<AnimatedLayer>("FPS", &AnimatedLayer::FPS, &AnimatedLayer::setFPS),
       readOnlyProperty<AnimatedLayer>("durationInSeconds", &AnimatedLayer::durationInSeconds)});
  return table;
}

void AnimatedLayer::getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) {
  Layer::getAnimatablePropsInArray(tracks);
  tracks.push_back(std::make_shared<TimelineTrack>(weak_from_this().lock(), "frame", "Time"));
}

std::shared_ptr<Animatable3DObject> AnimatedLayer::makeBlank() const {
  return std::make_shared<AnimatedLayer>();
}

void AnimatedLayer::copyInto(Animatable3DObject& target) const {
  Layer::copyInto(target);
  auto& copy = static_cast<AnimatedLayer&>(target);
  copy.setFPS(FPS_);
  copy.setNFrames(nFrames_);
}

void AnimatedLayer::encodeWithCoder(KeyedArchiver& coder) const {
  Layer::encodeWithCoder(coder);
  coder.encodeInt32(nFrames_, "nFrames");
  coder.encodeInt32(FPS_, "FPS");
}

void AnimatedLayer::initWithCoder(KeyedUnarchiver& coder) {
  Layer::initWithCoder(coder);
  nFrames_ = coder.decodeInt32ForKey("nFrames");
  FPS_ = coder.decodeInt32ForKey("FPS");
}

}  // namespace cloudreel
