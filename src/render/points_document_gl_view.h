#pragma once
// The interactive view of a document window, free of any toolkit: which
// camera to look through (the scene camera, the selected camera, a camera
// path being played, a free trackball camera, or a fixed orthographic view
// along one of six axes), the projection of the three view modes (normal
// perspective, orthographic, red/cyan-style anaglyph), the drawing of the
// document with the view's render options and the overlay, and what keys,
// mouse drags, gestures and the scroll wheel do to the cameras and to the
// layer being edited.
//
// The window is a thin shell: it makes its context current and calls
// prepare once, reshape on every resize and drawFrame to paint; it
// translates its events into the plain calls below, with pointer positions
// in the view's pixels, y growing upwards; and it repaints when the display
// handler is called.

#include <array>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "camera/rw_trackball.h"
#include "platform/error.h"
#include "platform/object.h"
#include "platform/plane.h"
#include "platform/run_loop.h"
#include "render/opengl_scene.h"
#include "render/render_options.h"
#include "scene/my_document.h"

namespace cloudreel {

class Camera;
class CameraPath;
class Layer;

// The keys held with a mouse, gesture or wheel event.
struct ViewModifiers {
  bool shift = false;
  bool option = false;
  bool command = false;
};

// The colour channels one anaglyph pass writes (alpha is always written).
struct ColorMask {
  bool red = true;
  bool green = true;
  bool blue = true;
  friend bool operator==(const ColorMask&, const ColorMask&) = default;
};

// One line of the 16:9 guide, from (x0, y0) to (x1, y1) in view pixels.
struct GuideLine {
  double x0 = 0, y0 = 0, x1 = 0, y1 = 0;
};

class PointsDocumentGLView : public Object, public DocumentView {
 public:
  enum ViewMode : std::int32_t { kNormal = 0, kOrthographic = 1, kAnaglyph = 2 };
  enum EditMode : std::int32_t { kNoEditing = 0, kEditSelectedLayer = 1, kEditLight = 2 };
  enum CameraMode : std::int32_t {
    kSceneCamera = 0,
    kCameraPathOrTrackball = 1,
    kSelectedCamera = 2,
    kTrackballCamera = 3
  };

  // The loop runs the playback timer: the main loop in the application,
  // the test's own in tests. It must outlive the view. The render options
  // start as: no camera, editor YES, bucket override NO, bucket fraction
  // 1.0. framesPerSecond starts from the "KTDefaultFPS" default.
  explicit PointsDocumentGLView(RunLoop& runLoop = RunLoop::main());
  // Stops playback, ends editing and leaves the document's views.
  ~PointsDocumentGLView() override;

  std::string_view className() const override { return "PointsDocumentGLView"; }
  const PropertyTable& properties() const override;

  // --- the document shown. Not owned: the window sets it and sets null
  // before the document goes. The view registers itself as one of the
  // document's views, so document changes redraw it.
  MyDocument* document() const { return document_; }
  void setDocument(MyDocument* document);

  // Redraw requests (from the document and from the view itself) set the
  // flag and call the handler, where the window schedules a repaint.
  void setNeedsDisplay() override;
  bool needsDisplay() const { return needsDisplay_; }
  void setDisplayHandler(std::function<void()> handler) { displayHandler_ = std::move(handler); }

  // --- observable properties
  std::int32_t viewMode() const { return viewMode_; }
  std::int32_t editMode() const { return editMode_; }
  std::int32_t cameraMode() const { return cameraMode_; }
  // The orthographic zoom exponent: the shorter side of the view spans
  // 2 / 2^orthoScale world units.
  float orthoScale() const { return orthoScale_; }
  std::int32_t glassesType() const { return glassesType_; }
  bool shouldDrawAnaglyph() const { return viewMode_ == kAnaglyph; }
  float eyeSeparation() const { return eyeSeparation_; }
  std::int32_t animframe() const { return animframe_; }
  bool loopAnimation() const { return loopAnimation_; }
  float framesPerSecond() const { return framesPerSecond_; }
  bool showTrackball() const { return showTrackball_; }
  bool isFullScreen() const { return isFullScreen_; }
  bool isPanning() const { return isPanning_; }
  bool isPanningKeyDown() const { return isPanningKeyDown_; }
  bool isAnimating() const { return isAnimating_; }

  // Modes 0, 1 and 2 (see the .cpp for what leaving and entering does);
  // other values are stored and draw nothing.
  void setViewMode(std::int32_t mode);
  void setEditMode(std::int32_t mode);
  // Any value; those without a rule of their own look through the
  // trackball camera.
  void setCameraMode(std::int32_t mode);
  // A value that is not a number is ignored.
  void setOrthoScale(float v);
  void setGlassesType(std::int32_t v);
  void setEyeSeparation(float v);
  void setAnimframe(std::int32_t v);
  void setLoopAnimation(bool v) { changeValueForKey("loopAnimation", loopAnimation_, v); }
  // Takes effect at the next start of playback.
  void setFramesPerSecond(float v) { changeValueForKey("framesPerSecond", framesPerSecond_, v); }
  void setShowTrackball(bool v);
  void setIsFullScreen(bool v) { changeValueForKey("isFullScreen", isFullScreen_, v); }

  RenderOptions& renderOptions() { return renderOptions_; }
  const OpenGLScene& glScene() const { return glScene_; }
  RWTrackball& trackball() { return *trackball_; }
  const std::shared_ptr<RWTrackball>& trackballCamera() const { return trackball_; }
  // 0..5: -X, -Y, -Z, +X, +Y, +Z.
  int orthoAxis() const { return orthoAxis_; }
  const std::array<double, 3>& orthoPan() const { return orthoPan_; }
  const std::array<double, 3>& keyboardTranslation() const { return keyboardTranslation_; }
  const std::shared_ptr<CameraPath>& cameraPath() const { return cameraPath_; }
  // The layer being edited (the selected layer or the light); null when not
  // editing.
  std::shared_ptr<Layer> editingLayer() const { return editingLayer_.lock(); }

  // --- drawing; each runs in whatever GL context is current
  // Smooth shading, lighting, depth test and writes, alpha blending, the
  // light model, light 0, linear fog 5..20 and the front material.
  void prepare();
  // The view's size in pixels becomes the scene's; the viewport follows.
  void reshape(double width, double height);
  // The whole frame: cleared to the "KTBackgroundColor" default, then, when
  // the document has a scene camera, drawn by view mode. A view without
  // area (a zero width or height) is only cleared: no projection can be
  // made for it.
  void drawFrame();
  // The document through the chosen camera with the view's render options,
  // the axes, the trackball gizmo when shown, and the overlay; nothing
  // without a document. The projection is the caller's.
  void drawDocument();
  // The view's picture as "out.tiff" in the "KTImageSavePath" folder.
  bool captureScreenShot(Error* error = nullptr) const;

  // The camera drawDocument looks through now: in orthographic mode a new
  // default camera (the view's own pan and turn are applied around it);
  // else the playing camera path's camera at animframe (the scene camera
  // where the path has none for that frame); else the selected camera in
  // camera mode 2; else the scene camera in camera mode 0; else the
  // trackball camera. Null only where the rule's camera is missing (no
  // document in camera mode 0).
  std::shared_ptr<Camera> currentCamera() const;

  // --- orthographic views
  // Stores the axis, switches to orthographic mode and turns the view to
  // the axis's preset. The turn is the view's own: the free trackball camera
  // keeps its turn for when it is looked through again. An axis outside
  // 0..5 is logged and taken as 0.
  void cameraPreset(int axis);
  void zoomIn();
  void zoomOut();
  static std::string_view labelForOrthoAxis(int axis);
  // The preset whose view is nearest that of the orientation matrix (see
  // the .cpp for the order of the candidates and how ties are broken).
  static int nearestOrthoAxisForMatrix(const AffineTransform& m);

  // What each anaglyph pass writes for a glasses type: pass 0 or 1.
  static ColorMask colorMaskForGlasses(std::int32_t glassesType, int pass);
  // The two lines of the 16:9 guide for a view of this size.
  static std::array<GuideLine, 2> guideLinesForSize(double width, double height);
  // The overlay's first line for an OpenGL error code.
  static std::string textForGLError(unsigned code);

  // --- camera-path playback on the run loop
  // Starts playing the path from its first frame on a repeating timer of
  // 1 / framesPerSecond. A null path is logged and ignored; without a
  // positive, finite rate there is no interval and nothing starts (logged).
  void beginAnimatingWithCameraPath(std::shared_ptr<CameraPath> path);
  // One tick: the next frame, wrapping (with loopAnimation) or stopping
  // past the path's last frame.
  void timerCallback();
  void stopAnimating();
  // A single step, the timer stopped: the next frame when animating
  // (wrapping at the end), else frame 0 of this path.
  void advanceFrameForCameraPath(std::shared_ptr<CameraPath> path);

  // --- input. Keys take the event's characters (the first one counts);
  // repeats are ignored.
  void keyDown(std::string_view characters, bool isRepeat = false);
  void keyUp(std::string_view characters);
  void mouseDown(Point2D point, ViewModifiers modifiers = {});
  void mouseDragged(Point2D point);
  void mouseUp(Point2D point);
  void rightMouseDown(Point2D point);
  void rightMouseDragged(Point2D point);
  void rightMouseUp(Point2D point);
  // Trackpad magnification (0.1 is a 10% pinch); ignored while Command is
  // held.
  void magnify(double magnification, ViewModifiers modifiers = {});
  // Trackpad rotation in degrees; acts only while editing with Command.
  void rotateGesture(double degrees, ViewModifiers modifiers = {});
  // The end of a trackpad gesture: a gesture edit is committed.
  void endGesture();
  // A mouse wheel: each line acts as a magnification of kWheelStep, so a
  // user without a trackpad zooms as with a pinch.
  void scrollWheel(double lines, ViewModifiers modifiers = {});
  static constexpr double kWheelStep = 0.1;

  // Moves the scene camera back along its view until every visible layer's
  // box is in view, with near and far planes around it; one undo step
  // "Frame Scene". Nothing happens (logged) without a document, a scene
  // camera or a visible layer with a box.
  void frameScene();

 private:
  enum class DragKind { None, Trackball, Pan, Orthographic, Dolly };

  void storeViewMode(std::int32_t mode);
  void invalidateTimer();
  void setIsAnimating(bool v);
  void setIsPanning(bool v) { changeValueForKey("isPanning", isPanning_, v); }
  void setIsPanningKeyDown(bool v) { changeValueForKey("isPanningKeyDown", isPanningKeyDown_, v); }
  // 2^orthoScale with the exponent held to ±60, so the view's extent is
  // always a finite, non-zero number.
  double orthoFactor() const;
  // World units (at orthoScale) a pixel spans; 0 for a view without area.
  double worldUnitsPerPixel() const;
  void setupOrthographicProjection() const;
  void drawNormal(const Camera& camera);
  void drawAnaglyph(const Camera& camera);
  void drawOrthographic();
  void drawTextLayer();
  void drawGuide() const;
  // The camera a dolly moves: the scene camera or the trackball camera;
  // null for the cameras of the document's recording (a path, the
  // selected camera).
  std::shared_ptr<Camera> navigableCamera() const;
  void dollyDrag(Point2D point);
  void panDrag(Point2D point);
  void editDrag(Point2D point);
  void finishOrthographicDrag();

  RunLoop& runLoop_;
  MyDocument* document_ = nullptr;
  bool needsDisplay_ = false;
  std::function<void()> displayHandler_;

  RenderOptions renderOptions_;
  OpenGLScene glScene_;
  std::shared_ptr<RWTrackball> trackball_;

  std::int32_t viewMode_ = kNormal;
  std::int32_t editMode_ = kNoEditing;
  std::int32_t cameraMode_ = kSceneCamera;
  float orthoScale_ = 0.0f;
  std::int32_t glassesType_ = 1;
  float eyeSeparation_ = 1.0f;
  std::int32_t animframe_ = 0;
  bool loopAnimation_ = false;
  float framesPerSecond_ = 25.0f;
  bool showTrackball_ = false;
  bool isFullScreen_ = false;
  bool isPanning_ = false;
  bool isPanningKeyDown_ = false;
  bool isAnimating_ = false;

  std::shared_ptr<CameraPath> cameraPath_;
  std::optional<RunLoop::TimerId> timer_;
  std::weak_ptr<Layer> editingLayer_;
  int orthoAxis_ = 5;
  // The orthographic turn, degrees about an axis (the preset of orthoAxis_).
  AxisAngle orthoRotation_{0.0, 0.0, 1.0, 0.0};
  std::array<double, 3> orthoPan_{};
  std::array<double, 3> keyboardTranslation_{};
  float gestureScale_ = 1.0f;
  float gestureRotation_ = 0.0f;
  bool gestureEdited_ = false;

  // The drag in progress: where it started, where it was last seen, which
  // keys were held at its mouse-down, and whether it changed anything.
  DragKind drag_ = DragKind::None;
  Point2D dragStart_;
  Point2D dragLast_;
  ViewModifiers mouseDownModifiers_;
  float dragStartOrthoScale_ = 0.0f;
  bool dragMoved_ = false;
};

}  // namespace cloudreel
