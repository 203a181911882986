#include "render/offline_gl_renderer.h"

#include <epoxy/gl.h>

#include <array>
#include <cstring>
#include <ctime>

#include "camera/camera.h"
#include "camera/camera_path.h"
#include "platform/application_defaults.h"
#include "platform/log.h"
#include "platform/user_defaults.h"
#include "render/gl/gl_error.h"
#include "render/gl/image_file.h"
#include "scene/my_document.h"

namespace cloudreel {
namespace {

constexpr std::string_view kRendererDomain = "Cloudreel";
constexpr int kRendererErrorCode = 100;
// The stereo separation is given in the settings sheet's units; the frustum
// window moves by half of it over this, in the near plane's units, each way.
constexpr double kStereoSeparationScale = 150.0;

// The lighting every off-screen frame starts from. Whether lighting is on is
// left to the layers (point layers with normals switch it on). No fog is set
// up: a layer that fogs uses the context's default fog.
void setUpLighting() {
  constexpr std::array<GLfloat, 4> kAmbient{0.2f, 0.2f, 0.2f, 1.0f};
  constexpr std::array<GLfloat, 4> kDiffuse{1.0f, 1.0f, 1.0f, 1.0f};
  constexpr std::array<GLfloat, 4> kMaterialAmbient{0.1f, 0.1f, 0.1f, 1.0f};
  constexpr std::array<GLfloat, 4> kMaterialDiffuse{0.9f, 0.9f, 0.9f, 1.0f};
  glLightModelfv(GL_LIGHT_MODEL_AMBIENT, kAmbient.data());
  glLightfv(GL_LIGHT0, GL_DIFFUSE, kDiffuse.data());
  glEnable(GL_LIGHT0);
  glMaterialfv(GL_FRONT, GL_AMBIENT, kMaterialAmbient.data());
  glMaterialfv(GL_FRONT, GL_DIFFUSE, kMaterialDiffuse.data());
}

bool fail(Error* error, std::string message) {
  setError(error, std::string(kRendererDomain), kRendererErrorCode, std::move(message));
  return false;
}

// Keeps the first failure of a frame's files.
void keepFirst(bool& ok, Error* error, const Error& failure) {
  if (ok && error != nullptr) {
    *error = failure;
  }
  ok = false;
}

}  // namespace

OfflineGLRenderer::OfflineGLRenderer(const OpenGLScene& scene,
                                     std::unique_ptr<gl::GLContext> context, bool exportDepth)
    : scene_(scene),
      context_(std::move(context)),
      outputPath_(UserDefaults::standardUserDefaults().stringForKey(kImageSavePathKey)),
      isDepthRender_(exportDepth) {
  renderOptions_.setSceneCamera(nullptr);
  renderOptions_.setValueForKey(false, kRenderOptionEditor);
  // Off-screen frames always draw each point layer with its own bucket
  // limit: the document's override is the interactive view's alone.
  renderOptions_.setValueForKey(false, kRenderOptionBucketOverride);
  renderOptions_.setValueForKey(1.0f, kRenderOptionBucketGlobal);
}

OfflineGLRenderer::~OfflineGLRenderer() {
  // The framebuffer's names are deleted with this context current, or wait
  // in the share group until one of its contexts is current.
  if (context_) {
    const gl::CurrentContext current(*context_);
    framebuffer_.reset();
  }
}

std::unique_ptr<OfflineGLRenderer> OfflineGLRenderer::initWithSceneContextExportDepth(
    const OpenGLScene& scene, gl::GLContext& shareWith, bool exportDepth, Error* error) {
  Error failure;
  std::unique_ptr<gl::GLContext> context = shareWith.createSharedContext(&failure);
  if (!context) {
    logErrorf("Cannot create the renderer's OpenGL context: %s", failure.message);
    setError(error, failure.domain, failure.code, failure.message);
    return nullptr;
  }
  std::unique_ptr<OfflineGLRenderer> renderer(
      new OfflineGLRenderer(scene, std::move(context), exportDepth));
  const gl::CurrentContext current(*renderer->context_, &failure);
  if (!current) {
    logErrorf("Cannot use the renderer's OpenGL context: %s", failure.message);
    setError(error, failure.domain, failure.code, failure.message);
    return nullptr;
  }
  renderer->softwareGL_ = currentContextIsSoftware();
  renderer->cpuPassSupported_ = CpuPointPass::supportedByCurrentContext();
  glEnable(GL_BLEND);
  glBlendFunc(GL_SRC_ALPHA, GL_ONE_MINUS_SRC_ALPHA);
  glEnable(GL_DEPTH_TEST);
  glDepthMask(GL_TRUE);

  unsigned status = 0;
  renderer->framebuffer_ = gl::Framebuffer::create(scene.width(), scene.height(), &failure,
                                                   gl::FramebufferApi::Automatic, &status);
  if (!renderer->framebuffer_) {
    if (status != 0) {
      logErrorf("Framebuffer not complete! %x", status);
    } else {
      logErrorf("OpenGL Error: %04x after init", static_cast<unsigned>(GL_INVALID_VALUE));
    }
    setError(error, failure.domain, failure.code, failure.message);
    return nullptr;
  }
  renderer->framebuffer_->bind();
  if (const GLenum glError = glGetError(); glError != GL_NO_ERROR) {
    logErrorf("OpenGL Error: %04x after init", glError);
    fail(error, fmt::sprintf("OpenGL Error: %04x after init", glError));
    return nullptr;
  }
  return renderer;
}

bool OfflineGLRenderer::drawsPointsOnCpu() const {
  switch (pointRasterization_) {
    case PointRasterization::OpenGL:
      return false;
    case PointRasterization::Auto:
      return softwareGL_ && cpuPassSupported_;
    case PointRasterization::Cpu:
      break;
  }
  return cpuPassSupported_;
}

std::vector<std::filesystem::path> OfflineGLRenderer::pathsForFrame(int frame) const {
  return pathsForFrame(outputPath_, outputPattern_, isDepthRender_, isStereoRender_, frame);
}

std::vector<std::filesystem::path> OfflineGLRenderer::pathsForFrame(
    const std::filesystem::path& folder, const FramePattern& pattern, bool depth, bool stereo,
    int frame) {
  const std::string name = pattern.format(frame);
  if (stereo) {
    return {folder / ("L_" + name), folder / ("R_" + name)};
  }
  if (depth) {
    return {folder / name, folder / ("depth_" + name)};
  }
  return {folder / name};
}

bool OfflineGLRenderer::renderFrameOfDocumentForCamera(int frame, MyDocument& document,
                                                       const std::shared_ptr<Camera>& camera,
                                                       Error* error) {
  DrawnFrame drawn = drawFrameOfDocumentForCamera(frame, document, camera);
  return writeDrawnFrame(drawn, error);
}

OfflineGLRenderer::DrawnFrame OfflineGLRenderer::drawFrameOfDocumentForCamera(
    int frame, MyDocument& document, const std::shared_ptr<Camera>& camera) {
  DrawnFrame drawn;
  drawn.frame = frame;
  Error failure;
  const gl::CurrentContext current(*context_, &failure);
  if (!current || !framebuffer_ || !camera) {
    drawn.failed = true;
    fail(&drawn.error, !current ? failure.message : "Nothing to render through");
    return drawn;
  }
  framebuffer_->bind();
  scene_.setViewport();
  const std::vector<std::filesystem::path> paths = pathsForFrame(frame);
  const auto drawColour = [&](float offset, const std::filesystem::path& path) {
    scene_.setupFrustumForCamera(*camera, offset);
    renderColorFrameOfDocumentForCamera(document, camera);
    if (pointPass_ && pointPass_->failure() && !drawn.failed) {
      drawn.failed = true;
      drawn.error = *pointPass_->failure();
    }
    DrawnFrame::ColourFile file{path, spareColourImage()};
    if (!readColorFrame(file.image, &failure) && !drawn.failed) {
      drawn.failed = true;
      drawn.error = failure;
    }
    drawn.colour.push_back(std::move(file));
  };
  if (isStereoRender_) {
    // No depth image in stereo, even when one was asked for.
    const double halfShift = 0.5 * static_cast<double>(stereoSeparation_) / kStereoSeparationScale;
    drawColour(static_cast<float>(halfShift), paths[0]);
    drawColour(static_cast<float>(-halfShift), paths[1]);
    return drawn;
  }
  drawColour(0.0f, paths[0]);
  if (isDepthRender_) {
    DrawnFrame::DepthFile file{paths[1], spareDepthImage()};
    if (!completeFramebuffer() && !drawn.failed) {
      drawn.failed = true;
      drawn.error = *pointPass_->failure();
    }
    if (!framebuffer_->readDepth(file.image, &failure) && !drawn.failed) {
      drawn.failed = true;
      drawn.error = failure;
    }
    drawn.depth = std::move(file);
  }
  return drawn;
}

bool OfflineGLRenderer::writeDrawnFrame(DrawnFrame& drawn, Error* error) {
  bool ok = !drawn.failed;
  if (!ok && error != nullptr) {
    *error = drawn.error;
  }
  Error failure;
  // Every file is written even when an earlier one failed.
  for (DrawnFrame::ColourFile& file : drawn.colour) {
    if (file.image.isConsistent() && !file.image.pixels.empty() &&
        !gl::writeColorTiff(file.path, file.image, &failure)) {
      keepFirst(ok, error, failure);
    }
  }
  if (drawn.depth && !drawn.depth->image.values.empty() &&
      !gl::writeDepthTiff(drawn.depth->path, drawn.depth->image, &failure)) {
    keepFirst(ok, error, failure);
  }
  // The images go back for the frames to come.
  const std::lock_guard lock(spareMutex_);
  for (DrawnFrame::ColourFile& file : drawn.colour) {
    spareColour_.push_back(std::move(file.image));
  }
  if (drawn.depth) {
    spareDepth_.push_back(std::move(drawn.depth->image));
  }
  drawn.colour.clear();
  drawn.depth.reset();
  return ok;
}

gl::RgbaImage OfflineGLRenderer::spareColourImage() {
  const std::lock_guard lock(spareMutex_);
  if (spareColour_.empty()) {
    return {};
  }
  gl::RgbaImage image = std::move(spareColour_.back());
  spareColour_.pop_back();
  return image;
}

gl::DepthImage OfflineGLRenderer::spareDepthImage() {
  const std::lock_guard lock(spareMutex_);
  if (spareDepth_.empty()) {
    return {};
  }
  gl::DepthImage image = std::move(spareDepth_.back());
  spareDepth_.pop_back();
  return image;
}

void OfflineGLRenderer::renderColorFrameOfDocumentForCamera(MyDocument& document,
                                                            const std::shared_ptr<Camera>& camera) {
  // The context is the renderer's own: its framebuffer stays bound, so
  // what a caller reads or captures after the frame is this frame.
  if (framebuffer_) {
    framebuffer_->bind();
  }
  glMatrixMode(GL_MODELVIEW);
  glLoadIdentity();
  glClearColor(0, 0, 0, 0);
  glClear(GL_COLOR_BUFFER_BIT | GL_DEPTH_BUFFER_BIT);
  setUpLighting();
  renderOptions_.setSceneCamera(camera);
  CpuPointPass* pass = nullptr;
  if (pointRasterization_ == PointRasterization::Cpu && !cpuPassSupported_ && !warnedNoCpuPass_) {
    logWarningf(
        "This OpenGL cannot take frames drawn on the CPU back (it needs OpenGL 3.0); "
        "points are drawn through OpenGL");
    warnedNoCpuPass_ = true;
  }
  const bool onCpu = framebuffer_ && drawsPointsOnCpu();
  if (onCpu && !pointPass_) {
    pointPass_ = std::make_unique<CpuPointPass>();
  }
  if (framebuffer_ && pointPass_) {
    // Also when this frame draws its points through OpenGL: what an earlier
    // frame left in the pass is not this frame.
    pointPass_->beginFrame(framebuffer_->width(), framebuffer_->height(),
                           framebuffer_->depthBits());
  }
  if (onCpu) {
    pass = pointPass_.get();
  }
  renderOptions_.setCpuPointPass(pass);
  document.drawContentWithOptions(renderOptions_);
  if (pass != nullptr) {
    // The points of the last layers stay in the pass until something reads
    // the framebuffer itself: the colour frame is read from the pass.
    pass->flushKeepingFrame();
    renderOptions_.setCpuPointPass(nullptr);
  }
  glFinish();
  if (const GLenum glError = glGetError(); glError != GL_NO_ERROR) {
    // The frame is still saved.
    logWarningf("OpenGL Error: %04x", glError);
  }
}

bool OfflineGLRenderer::readColorFrame(gl::RgbaImage& out, Error* error) {
  if (pointPass_ && pointPass_->holdsFrame() && framebuffer_) {
    // The frame as the pass holds it, bottom row first, turned top row
    // first as the framebuffer reads.
    const int width = framebuffer_->width();
    const int height = framebuffer_->height();
    out.width = width;
    out.height = height;
    out.pixels.resize(out.rowBytes() * static_cast<std::size_t>(height));
    const std::uint32_t* colour = pointPass_->heldColour().data();
    for (int y = 0; y < height; ++y) {
      std::memcpy(
          out.pixels.data() + out.rowBytes() * static_cast<std::size_t>(y),
          colour + static_cast<std::size_t>(width) * static_cast<std::size_t>(height - 1 - y),
          out.rowBytes());
    }
    return true;
  }
  return framebuffer_ && framebuffer_->readColor(out, error);
}

bool OfflineGLRenderer::completeFramebuffer() { return !pointPass_ || pointPass_->writeBack(); }

// The design's single-file saves, as a drawn frame of one file each.
bool OfflineGLRenderer::saveColorFrame(const std::filesystem::path& path, Error* error) {
  DrawnFrame drawn;
  drawn.colour.push_back({path, spareColourImage()});
  if (!readColorFrame(drawn.colour.back().image, error)) {
    return false;
  }
  return writeDrawnFrame(drawn, error);
}

bool OfflineGLRenderer::saveDepthFrame(const std::filesystem::path& path, Error* error) {
  DrawnFrame drawn;
  drawn.depth = DrawnFrame::DepthFile{path, spareDepthImage()};
  if (!framebuffer_ || !completeFramebuffer() ||
      !framebuffer_->readDepth(drawn.depth->image, error)) {
    return false;
  }
  return writeDrawnFrame(drawn, error);
}

int renderCameraPathOfDocument(const CameraPath& path, MyDocument& document, double fieldOfView,
                               float zNear, float zFar) {
  const auto context = document.sharedGLContext();
  if (!context) {
    return 0;
  }
  const auto renderer = OfflineGLRenderer::initWithSceneContextExportDepth(
      OpenGLScene::initWithWidthHeightFieldOfViewZNearZFar(720, 480, fieldOfView, zNear, zFar),
      *context, false);
  if (!renderer) {
    return 0;
  }
  const std::time_t start = std::time(nullptr);
  const std::int32_t frames = path.nFrames();
  for (std::int32_t i = 0; i < frames; ++i) {
    (void)renderer->renderFrameOfDocumentForCamera(i, document, path.cameraInWorldSpaceForFrame(i));
  }
  const auto seconds = static_cast<int>(std::time(nullptr) - start);
  // Whole seconds: a render under one divides by zero and logs "inf".
  logf("Rendered %d frames in %d seconds, FPS:%0.2f", frames, seconds,
       static_cast<float>(frames) / static_cast<float>(seconds));
  return std::max(frames, 0);
}

}  // namespace cloudreel
