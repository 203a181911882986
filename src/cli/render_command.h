#pragma once
// `cloudreel render DOC.reel --out DIR [--frames A-B | --marks]
// [--size PRESET|WxH] [--depth] [--stereo SEPARATION] [--pattern FMT]
// [--camera-path NAME|INDEX] [--skip-existing] [--progress auto|plain|json]`:
// renders a document's timeline (or a camera path's frames) to numbered TIFF
// files, headless.

#include <optional>
#include <string>

namespace CLI {
class App;
}

namespace cloudreel {
class MyDocument;
}

namespace cloudreel::cli {

// Exit statuses of the command, as its help lists them.
inline constexpr int kRenderExitOk = 0;
// Bad input found before any frame was drawn: the document, the output
// folder, the range, the size, the pattern or the camera path.
inline constexpr int kRenderExitBadInput = 1;
// The render ran but some frame files could not be written.
inline constexpr int kRenderExitFramesNotWritten = 2;
// No context or framebuffer for rendering.
inline constexpr int kRenderExitNoRenderer = 3;
// Stopped by Ctrl-C (SIGINT) after the frame in flight.
inline constexpr int kRenderExitInterrupted = 130;

struct RenderCommandOptions {
  std::string document;
  std::string outputFolder;
  std::string frames;  // "A-B"; empty for the whole range
  bool marks = false;
  std::string size;  // a preset label or "WxH"; empty for preset 0
  bool depth = false;
  std::optional<float> stereoSeparation;
  std::string pattern = "output_%04d.tiff";
  std::string cameraPath;  // a name or an index; empty for the timeline
  bool skipExisting = false;
  std::string progress = "auto";
  // Where plain points are placed: "auto", "gl" or "cpu".
  std::string rasterizer = "auto";
};

// Adds the subcommand, which fills `options` when parsed.
CLI::App* addRenderCommand(CLI::App& app, RenderCommandOptions& options);

// Opens the document and renders it; answers the exit status.
int runRenderCommand(const RenderCommandOptions& options);

// Renders a document already in memory (the demo's); `options.document`
// only names it in messages. Answers the exit status.
int renderDocument(MyDocument& document, const RenderCommandOptions& options);

}  // namespace cloudreel::cli
