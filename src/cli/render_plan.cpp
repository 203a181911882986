#include "cli/render_plan.h"

#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <charconv>
#include <cmath>

#include "camera/camera_path.h"
#include "render/cpu_point_pass.h"
#include "render/render_properties_controller.h"
#include "scene/my_document.h"
#include "timeline/timeline.h"

namespace cloudreel::cli {
namespace {

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
  why = "No camera path \"" + key + "\" in the document (it has " + std::to_string(paths.size()) +
        "; `cloudreel info` lists them, counted from 0)";
  return nullptr;
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

std::optional<RenderPlan> planRender(const MyDocument& document,
                                     const RenderCommandOptions& options, std::string& why) {
  RenderPlan plan;
  if (!parseRenderSize(options.size, plan.width, plan.height, why)) {
    return std::nullopt;
  }
  Error error;
  const auto pattern = FramePattern::parse(options.pattern, &error);
  if (!pattern) {
    why = error.message;
    return std::nullopt;
  }
  plan.pattern = *pattern;
  if (!pointRasterizationNamed(options.rasterizer)) {
    why = "--rasterizer takes auto, gl or cpu, not " + options.rasterizer;
    return std::nullopt;
  }
  if (options.stereoSeparation && !std::isfinite(*options.stereoSeparation)) {
    why = "The stereo separation must be a number";
    return std::nullopt;
  }
  if (!options.cameraPath.empty()) {
    plan.cameraPath = findCameraPath(document, options.cameraPath, why);
    if (!plan.cameraPath) {
      return std::nullopt;
    }
  }
  const Timeline& timeline = *document.timeline();
  plan.available = plan.cameraPath ? RenderFrameRange{-1, plan.cameraPath->nFrames() - 1}
                                   : wholeTimelineRange(timeline);
  plan.range = plan.available;
  if (options.marks) {
    if (plan.cameraPath) {
      why = "--marks picks timeline frames; with --camera-path use --frames";
      return std::nullopt;
    }
    if (timeline.inPoint() < 0 || timeline.outPoint() < 0) {
      why = "The document's timeline has no mark-in and mark-out point";
      return std::nullopt;
    }
    plan.range = markedRange(timeline);
  }
  if (!options.frames.empty()) {
    if (!parseFrames(options.frames, plan.range)) {
      why = "--frames takes A-B, two frame numbers with 0 <= A <= B";
      return std::nullopt;
    }
    if (plan.range.firstFrame() < plan.available.firstFrame() ||
        plan.range.last > plan.available.last) {
      why = fmt::format("Frames {} are outside the {} (frames {}-{})", options.frames,
                        plan.cameraPath ? "camera path" : "timeline", plan.available.firstFrame(),
                        plan.available.last);
      return std::nullopt;
    }
  }
  if (plan.range.frameCount() == 0) {
    why = "There are no frames to render in that range";
    return std::nullopt;
  }
  return plan;
}

void addRenderOptions(CLI::App& command, RenderCommandOptions& options) {
  auto* frames = command.add_option(
      "--frames", options.frames,
      "render frames A to B only, e.g. 0-99 (to split a render across machines)");
  command.add_flag("--marks", options.marks, "render from the mark-in to the mark-out point")
      ->excludes(frames);
  command.add_option("--size", options.size,
                     "a preset (720p, 1080p, 480p, \"PAL Square Pixel\", 1600p, \"2k 16:9\", "
                     "\"4k 16:9\", 1024x768, \"iPad retina\", Wu-TangXGA, WQHD; any case) or "
                     "WIDTHxHEIGHT; default 720p, which is 1440x720");
  command.add_flag("--depth", options.depth,
                   "also write a 16-bit depth image a frame (depth_ + the frame's name)");
  command.add_option("--stereo", options.stereoSeparation,
                     "write a left and a right image a frame (L_ and R_ + the frame's name) with "
                     "this eye separation (the application's default is 0.2)");
  command
      .add_option("--pattern", options.pattern,
                  "frame file names: a printf format with one integer conversion")
      ->capture_default_str();
  command.add_option("--camera-path", options.cameraPath,
                     "render through a camera path's frames instead of the timeline: its name, "
                     "or its index from 0 as `cloudreel info` lists cameraPaths");
  command
      .add_option("--rasterizer", options.rasterizer,
                  "where plain points are drawn: gl (through OpenGL), cpu (on every core, "
                  "into the frame OpenGL drew), or auto (cpu where OpenGL is a software "
                  "rasteriser, gl on a GPU); the frames are the same")
      ->capture_default_str();
  command.add_flag("--skip-existing", options.skipExisting,
                   "leave frames whose files are all there (to resume a stopped render)");
}

}  // namespace cloudreel::cli
