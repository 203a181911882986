#pragma once
// `cloudreel demo [DIR] [--no-render] [--size PRESET|WxH] [--points N]`:
// makes the built-in demo in DIR: a synthetic reconstruction in the bundle
// format (its points, its cameras and the photographs they took), a
// document animating it (a flight over the scene, point size and bucket
// ramps, a primitive, a marker and the light) and, unless told not to, the
// document's timeline rendered to frames. One line a step on standard
// output says what was made where and how long it took.

#include <cstdint>
#include <string>

namespace CLI {
class App;
}

namespace cloudreel::cli {

struct DemoOptions {
  std::string folder = "cloudreel-demo";
  bool noRender = false;
  std::string size = "480p";
  std::int32_t points = 1'000'000;
};

// Adds the subcommand, which fills `options` when parsed.
CLI::App* addDemoCommand(CLI::App& app, DemoOptions& options);

// Answers the process's exit status: 0, 1 when the demo could not be made
// (one line on standard error; what this run had made is removed), or the
// render's own status when only the frames failed.
int runDemoCommand(const DemoOptions& options);

}  // namespace cloudreel::cli
