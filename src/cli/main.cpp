// The cloudreel command: headless front end of the application.

#include <CLI/CLI.hpp>

#include <cstdio>

int main(int argc, char** argv) {
  CLI::App app{
      "Cloudreel: look at and animate large coloured point clouds with the cameras that "
      "photographed them, and render the animation to numbered TIFF frames.",
      "cloudreel"};
  app.set_version_flag("--version", std::string("cloudreel ") + CLOUDREEL_VERSION);
  app.footer("Run 'cloudreel COMMAND --help' for the options of a command.");
  CLI11_PARSE(app, argc, argv);
  if (argc <= 1) {
    std::fputs(app.help().c_str(), stdout);
  }
  return 0;
}
