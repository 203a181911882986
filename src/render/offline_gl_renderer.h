#pragma once
// Renders a document into image files without a view: one frame at a time
// into an off-screen framebuffer of its own context (which shares display
// lists and buffers with the document's), read back and written as TIFF,
// with a depth image a frame or as a left and right stereo pair.
//
// A renderer serves one render and one thread at a time: every frame makes
// its context current on the calling thread and puts back what was current
// before, so the frames of a render may run on a background thread while the
// main thread applies the timeline between them.

#include <filesystem>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "platform/error.h"
#include "render/cpu_point_pass.h"
#include "render/frame_pattern.h"
#include "render/gl/framebuffer.h"
#include "render/gl/gl_context.h"
#include "render/gl/image.h"
#include "render/opengl_scene.h"
#include "render/render_options.h"

namespace cloudreel {

class Camera;
class CameraPath;
class MyDocument;

class OfflineGLRenderer {
 public:
  // A renderer drawing the scene's size in a new context that shares with
  // `shareWith`. Null when the context, the framebuffer or the read-back
  // images cannot be made; the reason is logged ("Framebuffer not complete!
  // %x", "OpenGL Error: %04x after init") and given in `error`.
  [[nodiscard]] static std::unique_ptr<OfflineGLRenderer> initWithSceneContextExportDepth(
      const OpenGLScene& scene, gl::GLContext& shareWith, bool exportDepth, Error* error = nullptr);
  ~OfflineGLRenderer();
  OfflineGLRenderer(const OfflineGLRenderer&) = delete;
  OfflineGLRenderer& operator=(const OfflineGLRenderer&) = delete;

  // Draws frame `frame` through the camera and writes its files into
  // outputPath: the colour frame named by the pattern, and "depth_" + that
  // name when rendering depth; in stereo only "L_" and "R_" + that name, the
  // frustum shifted by ±0.5 × separation / 150. Every file is drawn and
  // written even when an earlier one fails; the answer is false, with the
  // first failure in `error`, if any was not written (the application
  // ignores it, the command line reports it).
  bool renderFrameOfDocumentForCamera(int frame, MyDocument& document,
                                      const std::shared_ptr<Camera>& camera,
                                      Error* error = nullptr);

  // A frame drawn and read back, its files not yet written: the two halves
  // of renderFrameOfDocumentForCamera, so that a render can write one
  // frame's files on another thread while it draws the next.
  struct DrawnFrame {
    struct ColourFile {
      std::filesystem::path path;
      gl::RgbaImage image;
    };
    struct DepthFile {
      std::filesystem::path path;
      gl::DepthImage image;
    };
    int frame = 0;
    std::vector<ColourFile> colour;
    std::optional<DepthFile> depth;
    // Drawing or reading back failed; nothing of it is written.
    bool failed = false;
    Error error;
  };
  // Draws every view of the frame and reads each back into images of its
  // own (reused from frames already written).
  DrawnFrame drawFrameOfDocumentForCamera(int frame, MyDocument& document,
                                          const std::shared_ptr<Camera>& camera);
  // Writes the drawn frame's files and keeps its images for later frames.
  // Needs no context: any thread may write while another draws.
  bool writeDrawnFrame(DrawnFrame& frame, Error* error = nullptr);

  // Clears and draws one colour frame through the camera into the
  // renderer's framebuffer, with the frustum already set up by the caller
  // (renderFrameOfDocumentForCamera does it). The renderer's context must be
  // current (CurrentContext around the draw and the save or read after it).
  // Points placed on the CPU after the frame's last OpenGL drawing reach
  // the framebuffer only when it is read through the renderer (the read
  // and save functions below) or completeFramebuffer() is called; the
  // colour frame is then taken without reading OpenGL at all.
  void renderColorFrameOfDocumentForCamera(MyDocument& document,
                                           const std::shared_ptr<Camera>& camera);
  // Puts the last frame's CPU points into the framebuffer, for a caller
  // that reads it with OpenGL itself. False, with the reason in the pass's
  // failure, if they could not be written back.
  bool completeFramebuffer();
  // Read back what was drawn, top row first, and write it atomically.
  bool saveColorFrame(const std::filesystem::path& path, Error* error = nullptr);
  bool saveDepthFrame(const std::filesystem::path& path, Error* error = nullptr);
  // Reads the last drawn colour frame into `out` instead (RGBA, top row
  // first); false without a current context.
  bool readColorFrame(gl::RgbaImage& out, Error* error = nullptr);

  // The files frame `frame` writes, in the order written.
  std::vector<std::filesystem::path> pathsForFrame(int frame) const;
  // The same for any renderer's settings: the pattern's name in the
  // folder, then "depth_" + that name when rendering depth; in stereo only
  // "L_" and "R_" + that name.
  static std::vector<std::filesystem::path> pathsForFrame(const std::filesystem::path& folder,
                                                          const FramePattern& pattern, bool depth,
                                                          bool stereo, int frame);

  gl::GLContext& context() { return *context_; }
  const OpenGLScene& scene() const { return scene_; }
  const RenderOptions& renderOptions() const { return renderOptions_; }

  bool isDepthRender() const { return isDepthRender_; }
  const std::filesystem::path& outputPath() const { return outputPath_; }
  void setOutputPath(std::filesystem::path v) { outputPath_ = std::move(v); }
  const FramePattern& outputPattern() const { return outputPattern_; }
  void setOutputPattern(FramePattern v) { outputPattern_ = std::move(v); }
  bool isStereoRender() const { return isStereoRender_; }
  void setIsStereoRender(bool v) { isStereoRender_ = v; }
  float stereoSeparation() const { return stereoSeparation_; }
  void setStereoSeparation(float v) { stereoSeparation_ = v; }
  // Where plain points are placed (Auto unless set): see CpuPointPass.
  PointRasterization pointRasterization() const { return pointRasterization_; }
  void setPointRasterization(PointRasterization v) { pointRasterization_ = v; }
  // Whether frames place plain points on the CPU, as the setting resolves
  // on this renderer's OpenGL. "cpu" falls back to OpenGL, with a warning,
  // where the context cannot write a frame back.
  bool drawsPointsOnCpu() const;
  // Records the last colour frame handed to the CPU pass (0 when it drew
  // all its points through OpenGL).
  std::size_t pointsDrawnOnCpu() const { return pointPass_ ? pointPass_->pointsThisFrame() : 0; }

 private:
  OfflineGLRenderer(const OpenGLScene& scene, std::unique_ptr<gl::GLContext> context,
                    bool exportDepth);
  gl::RgbaImage spareColourImage();
  gl::DepthImage spareDepthImage();

  OpenGLScene scene_;
  std::unique_ptr<gl::GLContext> context_;
  std::optional<gl::Framebuffer> framebuffer_;
  std::filesystem::path outputPath_;
  FramePattern outputPattern_;
  RenderOptions renderOptions_;
  bool isDepthRender_ = false;
  bool isStereoRender_ = false;
  float stereoSeparation_ = 0.0f;
  PointRasterization pointRasterization_ = PointRasterization::Auto;
  // Read off the context when the renderer is made.
  bool softwareGL_ = false;
  bool cpuPassSupported_ = false;
  bool warnedNoCpuPass_ = false;
  std::unique_ptr<CpuPointPass> pointPass_;
  // Read-back images of written frames, kept so that a render allocates its
  // images once (two frames' worth when writing overlaps drawing).
  std::mutex spareMutex_;
  std::vector<gl::RgbaImage> spareColour_;
  std::vector<gl::DepthImage> spareDepth_;
};

// The view-controls panel's render of a camera path: each of the path's
// frames through its camera, at 720 × 480 with the view's field of view and
// near and far planes, into the user default KTImageSavePath as
// "out_%04d.tiff", on the calling thread without progress. Logs "Rendered
// %d frames in %d seconds, FPS:%0.2f" (whole seconds, so a render under a
// second logs an infinite rate). Answers how many frames were drawn; none
// when no renderer can be made (the log says why).
int renderCameraPathOfDocument(const CameraPath& path, MyDocument& document, double fieldOfView,
                               float zNear, float zFar);

}  // namespace cloudreel
