#pragma once
// A solid primitive the user adds beside the point clouds: a sphere, cube,
// teapot, cone, plane or wire sphere of a given size, segment count and
// colour. The shape is compiled into a display list on its first draw and
// called from the next draw on; the colour is applied as a material outside
// the list, so a colour change shows at once while a change of shape or
// segments shows only after the list is next rebuilt (a size change, or
// anything else that invalidates the layer's display lists).

#include <cstdint>
#include <memory>
#include <string_view>

#include "platform/color.h"
#include "render/gl/display_list.h"
#include "scene/layer.h"

namespace cloudreel {

class Sphere : public Layer {
 public:
  // The shape numbers saved scenes store; any other number draws a solid
  // sphere.
  static constexpr std::int32_t kShapeSphere = 0;
  static constexpr std::int32_t kShapeCube = 1;
  static constexpr std::int32_t kShapeTeapot = 2;
  static constexpr std::int32_t kShapeCone = 3;
  static constexpr std::int32_t kShapePlane = 4;
  static constexpr std::int32_t kShapeWireSphere = 5;

  // A white teapot named "Teapot", size 1, 32 segments.
  Sphere();

  std::string_view className() const override { return "Sphere"; }
  const PropertyTable& properties() const override;

  std::int32_t shape() const { return shape_; }
  // Edge of the cube, diameter of the spheres and of the cone's base,
  // height of the cone, side of the plane, scale of the teapot.
  float size() const { return size_; }
  // Slices and stacks of the spheres and the cone.
  std::int32_t segments() const { return segments_; }
  // Never null.
  const std::shared_ptr<Color>& color() const { return color_; }
  // Whether the properties panel offers the segment count: for the sphere
  // and the wire sphere only, although the cone uses it too.
  bool selectedObjectHasSegments() const {
    return shape_ == kShapeSphere || shape_ == kShapeWireSphere;
  }

  // Stores the shape and renames the layer after it ("Sphere", "Cube",
  // "Teapot", "Cone", "Plane"; "<UNKNOWN>" for any other number, the wire
  // sphere included). The cached shape is kept: it shows until the list is
  // next invalidated.
  void setShape(std::int32_t shape);
  // Stores the size and invalidates the cached shape.
  void setSize(float size);
  void setSegments(std::int32_t segments) { changeValueForKey("segments", segments_, segments); }
  // A null colour is stored as white.
  void setColor(std::shared_ptr<Color> color);

  // The document also observes "shape", "size", "segments" and "color" for
  // undo ("Change Shape", "Change Size", "Change Segments", "Change Colour").
  // The layer's "Transform" track, then "Size".
  void getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) override;
  void addObserversForDocument(MyDocument* document) override;
  void removeObserversForDocument(MyDocument* document) override;

  // Lit, with the colour as the front material's diffuse colour, and fogged
  // when the layer's enableFog is set. The frame that builds the display
  // list draws no shape; the shape appears from the next frame on.
  void drawGLWithOptions(const RenderOptions& options) override;

  // "shape" and "segments" (int32), "size" (float) and "color" (a byte
  // string holding a complete archive of the colour) after the layer keys.
  // Reading stores them directly, so the name is the one archived with the
  // layer, not the shape's.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  void copyInto(Animatable3DObject& target) const override;

 private:
  // Issues the shape in object coordinates (what the display list records).
  void drawShape() const;

  std::int32_t shape_ = kShapeTeapot;
  float size_ = 1.0f;
  std::int32_t segments_ = 32;
  std::shared_ptr<Color> color_;
  gl::DisplayList displayList_;
};

}  // namespace cloudreel
