#pragma once
// What the three parts of the document view share: its constants, the
// orthographic presets and the small geometry and drawing helpers. Only the
// view's own sources include this.

#include <array>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "camera/camera_framing.h"
#include "geometry/affine_transform.h"
#include "render/points_document_gl_view.h"

namespace cloudreel {

class Camera;
class Layer;
class MyDocument;

namespace document_view {

using Vec3 = std::array<double, 3>;

// The stereo offset of an anaglyph pass is ±0.5 × eyeSeparation over this,
// as the off-screen renderer's stereo pair is.
constexpr double kStereoSeparationScale = 150.0;
// The 16:9 guide's width over height.
constexpr double kGuideAspect = 1.7777778;
// The overlay's line buffer: longer lines are cut to 255 characters.
constexpr std::size_t kLineLength = 255;
// How far a perspective dolly moves the camera, in world units, for a drag
// across the view's shorter side.
constexpr double kDollyUnitsPerView = 10.0;
// The field of view a pinch may reach, in degrees: the projection needs a
// finite, positive tangent of its half.
constexpr float kMinFieldOfView = 1.0f;
constexpr float kMaxFieldOfView = 179.0f;
// The orthographic depth range: the scene is seen whole along the axis.
constexpr double kOrthoDepth = 1000.0;
// Playback intervals longer than this are held to it: a rate so low gives
// no frame within any sitting, and a longer interval would not fit the
// run loop's clock.
constexpr double kLongestFrameInterval = 3600.0;

// The six presets: degrees about an axis, and the label.
struct OrthoPreset {
  AxisAngle rotation;
  std::string_view label;
};
constexpr std::array<OrthoPreset, 6> kPresets{{
    {{90, 0, 1, 0}, "-X"},
    {{90, 1, 0, 0}, "-Y"},
    {{180, 0, 1, 0}, "-Z"},
    {{270, 0, 1, 0}, "+X"},
    {{270, 1, 0, 0}, "+Y"},
    {{0, 0, 1, 0}, "+Z"},
}};

int validAxis(int axis);

// Rotates v by an axis-angle in degrees (right-handed, as glRotated turns).
// A zero axis turns nothing.
Vec3 rotated(const Vec3& v, const AxisAngle& r);

Vec3 inverseRotated(const Vec3& v, const AxisAngle& r);

// Solves L·x = w for the linear block of a transform (column-major, element
// (row, col) at 4·col + row); nothing for a singular or non-finite block.
std::optional<Vec3> solveLinear(const AffineTransform& t, const Vec3& w);

// The layer's placement around its editing origin: objectToWorld ·
// animationTransform.
std::shared_ptr<AffineTransform> placementOf(const Layer& layer);

void glRotateAxisAngle(const AxisAngle& r);

void drawTextAt(int x, int y, std::string_view text);

// Moves the camera to the framing as one undo step named `name`; undoing
// puts back where it was, which registers the redo the same way.
void placeCameraUndoably(MyDocument& document, const std::shared_ptr<Camera>& camera,
                         const CameraFraming& to, const std::string& name);

}  // namespace document_view
}  // namespace cloudreel
