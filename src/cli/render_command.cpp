#include "cli/render_command.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>
#include <unistd.h>

#include <atomic>
#include <charconv>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <filesystem>

#include "camera/camera_path.h"
#include "camera/scene_camera.h"
#include "cli/document_input.h"
#include "cli/render_progress_line.h"
#include "render/offline_gl_renderer.h"
#include "render/render_properties_controller.h"
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

bool parseInt(std::string_view text, int& out) {
  const char* end = text.data() + text.size();
  const auto [ptr, ec] = std::from_chars(text.data(), end, out);
  return ec == std::errc() && ptr == end && !text.empty();
}


// "A-B" with 0 <= A <= B.
bool parseFrames(const std::string& text, RenderFrameRange& range) {
  const auto dash = text.find('-', 1);
  int first = 0;
  int last = 0;
  if (dash == std::string::npos || !parseInt(std::string_view(text).substr(0, dash), first) ||
      !parseInt(std::string_view(text).substr(dash + 1), last) || first < 0 || last < first) {
    return false;
  }
  range = {first - 1, last};
  return true;
}

// The camera path a name or an index (from 0, in the document's order of
// camera paths) chooses.
std::shared_ptr<CameraPath> findCameraPath(const MyDocument& document, const std::string& key,
                                           std::string& why) {
  const auto paths = document.cameraPaths();
  int index = 0;
  if (parseInt(key, index)) {
    if (index >= 0 && static_cast<std::size_t>(index) < paths.size()) {
      return paths[static_cast<std::size_t>(index)];
    }
  } else {
    for (const auto& path : paths) {
      if (path->name() == key) {
        return path;
      }
    }
  }
  why = "No camera path \"" + key + "\" in the document (it has " +
        std::to_string(paths.size()) + "; `cloudreel info` lists them, counted from 0)";
  return nullptr;
}

int badInput(const RenderCommandOptions& options, const std::string& message) {
  std::fprintf(stderr, "cloudreel render: %s: %s\n", options.document.c_str(), message.c_str());
  return kRenderExitBadInput;
}

}  // namespace

bool parseRenderSize(const std::string& text, int& width, int& height, std::string& why) {
  if (text.empty()) {
    width = kResolutionPresets[0].width;
    height = kResolutionPresets[0].height;
    return true;
  }
  if (const auto preset = resolutionPresetNamed(text)) {
    width = kResolutionPresets[static_cast<std::size_t>(*preset)].width;
    height = kResolutionPresets[static_cast<std::size_t>(*preset)].height;
    return true;
  }
  const auto x = text.find_first_of("xX");
  // The largest frame any OpenGL implementation makes is far below this;
  // the limit keeps the read-back images' sizes from overflowing.
  constexpr int kLargest = 32768;
  if (x != std::string::npos && parseInt(std::string_view(text).substr(0, x), width) &&
      parseInt(std::string_view(text).substr(x + 1), height) && width > 0 && height > 0 &&
      width <= kLargest && height <= kLargest) {
    return true;
  }
  std::string labels;
  for (const ResolutionPreset& preset : kResolutionPresets) {
    labels += (labels.empty() ? "\"" : ", \"") + std::string(preset.label) + "\"";
  }
  why = "Unknown size \"" + text + "\": give WIDTHxHEIGHT (1 to 32768 each) or one of " + labels;
  return false;
}

CLI::App* addRenderCommand(CLI::App& app, RenderCommandOptions& options) {
  CLI::App* command = app.add_subcommand(
      "render", "Render a document's timeline, or a camera path's frames, to numbered TIFF files.");
  command->add_option("DOC", options.document, "the .reel document to render")->required();
  command->add_option("--out", options.outputFolder, "the folder for the frames (made if missing)")
      ->required();
  auto* frames = command->add_option(
      "--frames", options.frames,
      "render frames A to B only, e.g. 0-99 (to split a render across machines)");
  command->add_flag("--marks", options.marks, "render from the mark-in to the mark-out point")
      ->excludes(frames);
  command->add_option("--size", options.size,
                      "a preset (720p, 1080p, 480p, \"PAL Square Pixel\", 1600p, \"2k 16:9\", "
                      "\"4k 16:9\", 1024x768, \"iPad retina\", Wu-TangXGA, WQHD; any case) or "
                      "WIDTHxHEIGHT; default 720p, which is 1440x720");
  command->add_flag("--depth", options.depth,
                    "also write a 16-bit depth image a frame (depth_ + the frame's name)");
  command->add_option("--stereo", options.stereoSeparation,
                      "write a left and a right image a frame (L_ and R_ + the frame's name) with "
                      "this eye separation (the application's default is 0.2)");
  command->add_option("--pattern", options.pattern,
                      "frame file names: a printf format with one integer conversion")
      ->capture_default_str();
  command->add_option("--camera-path", options.cameraPath,
                      "render through a camera path's frames instead of the timeline: its name, "
                      "or its index from 0 as `cloudreel info` lists cameraPaths");
  command->add_flag("--skip-existing", options.skipExisting,
                    "leave frames whose files are all there (to resume a stopped render)");
  command->add_option("--progress", options.progress,
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
  int width = 0;
  int height = 0;
  if (!parseRenderSize(options.size, width, height, why)) {
    return badInput(options, why);
  }
  Error error;
  const auto pattern = FramePattern::parse(options.pattern, &error);
  if (!pattern) {
    return badInput(options, error.message);
  }
  if (options.stereoSeparation && !std::isfinite(*options.stereoSeparation)) {
    return badInput(options, "The stereo separation must be a number");
  }
  std::shared_ptr<CameraPath> path;
  if (!options.cameraPath.empty()) {
    path = findCameraPath(document, options.cameraPath, why);
    if (!path) {
      return badInput(options, why);
    }
  }
  Timeline& timeline = *document.timeline();
  RenderFrameRange range = path ? RenderFrameRange{-1, path->nFrames() - 1}
                                : wholeTimelineRange(timeline);
  const RenderFrameRange available = range;
  if (options.marks) {
    if (path) {
      return badInput(options, "--marks picks timeline frames; with --camera-path use --frames");
    }
    if (timeline.inPoint() < 0 || timeline.outPoint() < 0) {
      return badInput(options, "The document's timeline has no mark-in and mark-out point");
    }
    range = markedRange(timeline);
  }
  if (!options.frames.empty()) {
    if (!parseFrames(options.frames, range)) {
      return badInput(options, "--frames takes A-B, two frame numbers with 0 <= A <= B");
    }
    if (range.firstFrame() < available.firstFrame() || range.last > available.last) {
      return badInput(options, fmt::format("Frames {} are outside the {} (frames {}-{})",
                                           options.frames, path ? "camera path" : "timeline",
                                           available.firstFrame(), available.last));
    }
  }
  if (range.frameCount() == 0) {
    return badInput(options, "There are no frames to render in that range");
  }
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
            width, height, sceneCamera ? sceneCamera->fieldOfView() : 45.0, 1.0f, 30.0f),
        *context, options.depth, &error);
  } else {
    error.message = "No OpenGL context for rendering";
  }
  if (!renderer) {
    std::fprintf(stderr, "cloudreel render: cannot render: %s\n", error.message.c_str());
    return kRenderExitNoRenderer;
  }
  renderer->setOutputPath(folder);
  renderer->setOutputPattern(*pattern);
  renderer->setIsStereoRender(options.stereoSeparation.has_value());
  renderer->setStereoSeparation(options.stereoSeparation.value_or(0.0f));
  OfflineGLRenderer& frames = *renderer;

  RenderProgressLine progress(RenderProgressLine::styleNamed(options.progress),
                              range.frameCount());
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
