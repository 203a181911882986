// The cloudreel command: headless front end of the application. Results go
// to standard output; progress, the core's log lines and failures go to
// standard error, so `cloudreel info --json` output can be piped as is.

#include <CLI/CLI.hpp>
#include <cstdio>

#include "cli/convert_command.h"
#include "cli/demo_command.h"
#include "cli/farm_command.h"
#include "cli/import_command.h"
#include "cli/info_command.h"
#include "cli/render_command.h"
#include "platform/log.h"

int main(int argc, char** argv) {
  CLI::App app{
      "Cloudreel: look at and animate large coloured point clouds with the cameras that "
      "photographed them, and render the animation to numbered TIFF frames.",
      "cloudreel"};
  app.set_version_flag("--version", std::string("cloudreel ") + CLOUDREEL_VERSION);
  app.footer("Run 'cloudreel COMMAND --help' for the options of a command.");
  app.require_subcommand(0, 1);
  bool verbose = false;
  app.add_flag("--verbose", verbose,
               "also show the diagnostic lines of the core on standard error (warnings and "
               "errors are always shown)");

  cloudreel::cli::InfoOptions info;
  const CLI::App* infoCommand = cloudreel::cli::addInfoCommand(app, info);
  cloudreel::cli::ConvertOptions convert;
  const CLI::App* convertCommand = cloudreel::cli::addConvertCommand(app, convert);
  cloudreel::cli::ImportOptions import;
  const CLI::App* importCommand = cloudreel::cli::addImportCommand(app, import);
  cloudreel::cli::RenderCommandOptions render;
  const CLI::App* renderCommand = cloudreel::cli::addRenderCommand(app, render);
  cloudreel::cli::FarmOptions farm;
  const CLI::App* farmCommand = cloudreel::cli::addFarmCommand(app, farm);
  cloudreel::cli::DemoOptions demo;
  const CLI::App* demoCommand = cloudreel::cli::addDemoCommand(app, demo);

  CLI11_PARSE(app, argc, argv);
  cloudreel::setLogThreshold(verbose ? cloudreel::LogLevel::Debug : cloudreel::LogLevel::Warning);
  if (infoCommand->parsed()) {
    return cloudreel::cli::runInfoCommand(info);
  }
  if (convertCommand->parsed()) {
    return cloudreel::cli::runConvertCommand(convert);
  }
  if (importCommand->parsed()) {
    return cloudreel::cli::runImportCommand(import);
  }
  if (renderCommand->parsed()) {
    return cloudreel::cli::runRenderCommand(render);
  }
  if (farmCommand->parsed()) {
    return cloudreel::cli::runFarmCommand(farm);
  }
  if (demoCommand->parsed()) {
    return cloudreel::cli::runDemoCommand(demo);
  }
  std::fputs(app.help().c_str(), stdout);
  return 0;
}
