#include "scene/sphere.h"

#include <epoxy/gl.h>

#include <string>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "render/gl/shapes.h"
#include "scene/my_document.h"
#include "timeline/float_value_track.h"

namespace cloudreel {

namespace {

std::shared_ptr<Color> white() { return Color::colorWithRGBA(1.0f, 1.0f, 1.0f, 1.0f); }

// The keys the document observes for undo, with the undo steps' names.
constexpr Layer::UndoableKey kUndoableKeys[] = {{"shape", "Change Shape"},
                                                {"size", "Change Size"},
                                                {"segments", "Change Segments"},
                                                {"color", "Change Colour"}};

void drawPlane(double size) {
  const double h = size * 0.5;
  glBegin(GL_QUADS);
  glNormal3d(0.0, 1.0, 0.0);
  glVertex3d(h, 0.0, h);
  glVertex3d(h, 0.0, -h);
  glVertex3d(-h, 0.0, -h);
  glVertex3d(-h, 0.0, h);
  glEnd();
}

}  // namespace

Sphere::Sphere() : color_(white()) { setShape(kShapeTeapot); }

const PropertyTable& Sphere::properties() const {
  static const PropertyTable table(
      &Layer::properties(),
      {property<Sphere>("shape", &Sphere::shape, &Sphere::setShape),
       property<Sphere>("size", &Sphere::size, &Sphere::setSize),
       property<Sphere>("segments", &Sphere::segments, &Sphere::setSegments),
       property<Sphere>("color", &Sphere::color, &Sphere::setColor),
       readOnlyProperty<Sphere>("selectedObjectHasSegments", &Sphere::selectedObjectHasSegments)});
  return table;
}

std::shared_ptr<Animatable3DObject> Sphere::makeBlank() const { return std::make_shared<Sphere>(); }

void Sphere::copyInto(Animatable3DObject& target) const {
  Layer::copyInto(target);
  auto& copy = static_cast<Sphere&>(target);
  copy.setSize(size_);
  copy.setSegments(segments_);
  // Setting the shape names the copy after it: a copy of a primitive the
  // user renamed "Ball" is called "Sphere", not "Ball copy", as copies of
  // primitives always have been.
  copy.setShape(shape_);
  // Colours are immutable, so sharing this one is as good as a copy.
  copy.setColor(color_);
}

void Sphere::setShape(std::int32_t shape) {
  // setName announces "name" itself; the derived flag changes with the
  // shape.
  willChangeValueForKey("shape");
  willChangeValueForKey("selectedObjectHasSegments");
  shape_ = shape;
  switch (shape) {
    case kShapeSphere:
      setName("Sphere");
      break;
    case kShapeCube:
      setName("Cube");
      break;
    case kShapeTeapot:
      setName("Teapot");
      break;
    case kShapeCone:
      setName("Cone");
      break;
    case kShapePlane:
      setName("Plane");
      break;
    case kShapeWireSphere:
      // Named twice, so a wire sphere ends up "<UNKNOWN>": the outline has
      // always listed it by that name, so the second name is kept.
      setName("Wire Sphere");
      setName("<UNKNOWN>");
      break;
    default:
      setName("<UNKNOWN>");
      break;
  }
  didChangeValueForKey("selectedObjectHasSegments");
  didChangeValueForKey("shape");
}

void Sphere::setSize(float size) {
  changeValueForKey("size", size_, size);
  invalidateOpenGLDisplayLists();
}

void Sphere::setColor(std::shared_ptr<Color> color) {
  changeValueForKey("color", color_, color ? std::move(color) : white());
}

void Sphere::getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) {
  Layer::getAnimatablePropsInArray(tracks);
  tracks.push_back(std::make_shared<FloatValueTrack>(weak_from_this().lock(), "size", "Size"));
}

void Sphere::addObserversForDocument(MyDocument* document) {
  Layer::addObserversForDocument(document);
  addUndoObservers(document, kUndoableKeys);
}

void Sphere::removeObserversForDocument(MyDocument* document) {
  removeUndoObservers(document, kUndoableKeys);
  Layer::removeObserversForDocument(document);
}

void Sphere::drawShape() const {
  const double size = size_;
  const double radius = size * 0.5;
  // The shapes draw nothing for fewer than 3 segments and clamp huge counts.
  switch (shape_) {
    case kShapeCube:
      gl::drawSolidCube(size);
      break;
    case kShapeTeapot:
      gl::drawSolidTeapot(size);
      break;
    case kShapeCone:
      gl::drawSolidCone(radius, size, segments_, segments_);
      break;
    case kShapePlane:
      drawPlane(size);
      break;
    case kShapeWireSphere:
      gl::drawWireSphere(radius, segments_, segments_);
      break;
    default:
      gl::drawSolidSphere(radius, segments_, segments_);
      break;
  }
}

void Sphere::drawGLWithOptions(const RenderOptions&) {
  const GLfloat diffuse[4] = {color_->red(), color_->green(), color_->blue(), color_->alpha()};
  glEnable(GL_LIGHTING);
  glMaterialfv(GL_FRONT, GL_DIFFUSE, diffuse);
  if (displayListInvalid()) {
    displayList_.invalidate();
    setDisplayListInvalid(false);
  }
  const bool fog = enableFog();
  if (fog) {
    glEnable(GL_FOG);
  }
  // Building the list only records the shape: that frame shows none, and
  // the shape is drawn from the next frame on. Kept, so that frame
  // sequences render as they always have.
  if (displayList_.isUsable()) {
    displayList_.call();
  } else {
    displayList_.compile([this] { drawShape(); });
  }
  if (fog) {
    glDisable(GL_FOG);
  }
  glDisable(GL_LIGHTING);
}

void Sphere::encodeWithCoder(KeyedArchiver& coder) const {
  Layer::encodeWithCoder(coder);
  coder.encodeInt32(shape_, "shape");
  coder.encodeFloat(size_, "size");
  coder.encodeInt32(segments_, "segments");
  const Bytes color = color_->archivedData();
  coder.encodeBytes(color, "color");
}

void Sphere::initWithCoder(KeyedUnarchiver& coder) {
  Layer::initWithCoder(coder);
  shape_ = coder.decodeInt32ForKey("shape");
  size_ = coder.decodeFloatForKey("size");
  segments_ = coder.decodeInt32ForKey("segments");
  // A missing colour, or bytes that are not an archived colour, read as
  // white, the colour of a new primitive: the shape stays visible and the
  // rest of the document still opens.
  const Bytes data = coder.decodeBytesForKey("color");
  std::shared_ptr<Color> color;
  if (!data.empty()) {
    Error error;
    color = Color::colorFromArchivedData(data, &error);
    if (!color) {
      logWarningf("primitive \"%s\": unreadable colour (%s); using white", name(), error.message);
    }
  }
  color_ = color ? std::move(color) : white();
}

}  // namespace cloudreel
