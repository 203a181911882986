#pragma once
// What a render will do, worked out from the options and the document
// before anything is drawn or submitted: the frame size, the file-name
// pattern, the camera path (if any) and the frames. `cloudreel render` and
// `cloudreel farm` check the same options the same way, so a render farm
// refuses on the login node what a task would refuse on a compute node.

#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "cli/render_command.h"
#include "render/frame_pattern.h"
#include "timeline/render_run.h"

namespace CLI {
class App;
}

namespace cloudreel {
class CameraPath;
class MyDocument;
}  // namespace cloudreel

namespace cloudreel::cli {

struct RenderPlan {
  int width = 0;
  int height = 0;
  FramePattern pattern;
  // Null: the timeline through the scene camera.
  std::shared_ptr<CameraPath> cameraPath;
  RenderFrameRange range;
  // Every frame the timeline or the path has (what --frames may pick from).
  RenderFrameRange available;
};

// Reads a frame size: a preset's label in any case, or WIDTHxHEIGHT with
// each from 1 to 32768; empty gives preset 0. On failure `why` is the
// one-line reason, listing the presets.
bool parseRenderSize(const std::string& text, int& width, int& height, std::string& why);

// Checks the options against the document. On failure `why` is the one-line
// reason.
std::optional<RenderPlan> planRender(const MyDocument& document,
                                     const RenderCommandOptions& options, std::string& why);

// The options shared by `render` and `farm`, added to either command.
void addRenderOptions(CLI::App& command, RenderCommandOptions& options);

}  // namespace cloudreel::cli
