#include "cli/render_command.h"

#include <fmt/format.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <atomic>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <filesystem>

#include "camera/camera_path.h"
#include "camera/scene_camera.h"
#include "cli/document_input.h"
#include "cli/render_plan.h"
#include "cli/render_progress_line.h"
#include "render/offline_gl_renderer.h"
#include "scene/my_document.h"
#include "timeline/render_run.h"
#include "timeline/timeline.h"

namespace cloudreel::cli {
namespace {

namespace fs = std::filesystem;

// Set by the Ctrl-C handler; the run reads it between frames.
std::atomic<bool> interrupted{false};

extern "C" void onInterrupt(int) { interrupted.store(true); }

// Ctrl-C for the life of a render: the frame in flight is finished, no
// other starts. The previous handler comes back afterwards.
class InterruptScope {
 public:
  InterruptScope() {
    interrupted.store(false);
    struct sigaction action {};
    action.sa_handler = onInterrupt;
    sigemptyset(&action.sa_mask);
    sigaction(SIGINT, &action, &previous_);
  }
  ~InterruptScope() { sigaction(SIGINT, &previous_, nullptr); }
  InterruptScope(const InterruptScope&) = delete;
  InterruptScope& operator=(const InterruptScope&) = delete;

 private:
  struct sigaction previous_ {};
};

int badInput(const RenderCommandOptions& options, const std::string& message) {
  std::fprintf(stderr, "cloudreel render: %s: %s\n", options.document.c_str(), message.c_str());
  return kRenderExitBadInput;
}

}  // namespace

CLI::App* addRenderCommand(CLI::App& app, RenderCommandOptions& options) {
  CLI::App* command = app.add_subcommand(
      "render", "Render a document's timeline, or a camera path's frames, to numbered TIFF files.");
  command->add_option("DOC", options.document, "the .reel document to render")->required();
  command->add_option("--out", options.outputFolder, "the folder for the frames (made if missing)")
      ->required();
  addRenderOptions(*command, options);
  command
      ->add_option("--progress", options.progress,
                   "auto (a live line on a terminal, plain lines otherwise), plain, or json "
                   "(one object a frame on standard output)")
      ->check(CLI::IsMember({"auto", "plain", "json"}))
      ->capture_default_str();
  command->footer(
      "Exit status: 0 all frames written; 1 bad input (document, folder, range, size, pattern or "
      "camera path), found before any frame is drawn; 2 some frames could not be written (each "
      "is named); 3 no OpenGL context or framebuffer for rendering; 130 stopped by Ctrl-C after "
      "the frame in flight.");
  return command;
}

int runRenderCommand(const RenderCommandOptions& options) {
  prepareForDocuments();
  MyDocument document;
  Error error;
  if (!readDocument(document, options.document, &error)) {
    std::fprintf(stderr, "cloudreel render: %s\n", error.message.c_str());
    return kRenderExitBadInput;
  }
  return renderDocument(document, options);
}

int renderDocument(MyDocument& document, const RenderCommandOptions& options) {
  // Everything the user gave is checked before a frame is drawn.
  std::string why;
  const std::optional<RenderPlan> plan = planRender(document, options, why);
  if (!plan) {
    return badInput(options, why);
  }
  const std::shared_ptr<CameraPath>& path = plan->cameraPath;
  const RenderFrameRange range = plan->range;
  Timeline& timeline = *document.timeline();
  Error error;
  const fs::path folder = options.outputFolder;
  std::error_code ec;
  fs::create_directories(folder, ec);
  if (!fs::is_directory(folder)) {
    return badInput(options, "Cannot make the output folder " + folder.string() +
                                 (ec ? ": " + ec.message() : ""));
  }

  const auto context = document.sharedGLContext();
  const std::shared_ptr<SceneCamera> sceneCamera = document.sceneCamera();
  std::unique_ptr<OfflineGLRenderer> renderer;
  if (context) {
    renderer = OfflineGLRenderer::initWithSceneContextExportDepth(
        OpenGLScene::initWithWidthHeightFieldOfViewZNearZFar(
            plan->width, plan->height, sceneCamera ? sceneCamera->fieldOfView() : 45.0, 1.0f,
            30.0f),
        *context, options.depth, &error);
  } else {
    error.message = "No OpenGL context for rendering";
  }
  if (!renderer) {
    std::fprintf(stderr, "cloudreel render: cannot render: %s\n", error.message.c_str());
    return kRenderExitNoRenderer;
  }
  renderer->setOutputPath(folder);
  renderer->setOutputPattern(plan->pattern);
  renderer->setIsStereoRender(options.stereoSeparation.has_value());
  renderer->setStereoSeparation(options.stereoSeparation.value_or(0.0f));
  renderer->setPointRasterization(
      pointRasterizationNamed(options.rasterizer).value_or(PointRasterization::Auto));
  OfflineGLRenderer& frames = *renderer;

  RenderProgressLine progress(RenderProgressLine::styleNamed(options.progress), range.frameCount());
  int unwritten = 0;
  bool cancelledRun = false;
  bool done = false;
  const InterruptScope interruptScope;
  RenderRun::Hooks hooks;
  hooks.prepareFrame = [&](int frame) -> std::shared_ptr<Camera> {
    if (path) {
      return path->cameraInWorldSpaceForFrame(frame);
    }
    // What moving the timeline's cursor does: every track takes its value
    // at the frame's time.
    timeline.applyForTime(timeForRenderFrame(timeline, frame));
    document.hasChanged();
    return document.sceneCamera();
  };
  if (options.skipExisting) {
    hooks.shouldRenderFrame = [&](int frame) {
      for (const fs::path& file : frames.pathsForFrame(frame)) {
        if (!fs::is_regular_file(file)) {
          return true;
        }
      }
      progress.frameSkipped(frame);
      return false;
    };
  }
  hooks.hasCancelled = [] { return interrupted.load(); };
  hooks.frameFinished = [&](int frame, bool written, const Error& failure) {
    if (!written) {
      ++unwritten;
    }
    progress.frameDone(frame, written, failure.message, frames.pathsForFrame(frame));
  };
  hooks.finished = [&](bool cancelled) {
    cancelledRun = cancelled;
    done = true;
  };
  progress.start(folder);
  auto run = RenderRun::create(document, std::move(renderer), range, std::move(hooks));
  run->start();
  (void)RunLoop::main().runUntil([&] { return done; }, std::chrono::hours(24 * 365));
  progress.finish(cancelledRun, unwritten);
  if (cancelledRun) {
    return kRenderExitInterrupted;
  }
  return unwritten > 0 ? kRenderExitFramesNotWritten : kRenderExitOk;
}

}  // namespace cloudreel::cli
