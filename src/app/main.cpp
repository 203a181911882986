// cloudreel-app: the desktop application. Opens the documents named on the
// command line (a point file or reconstruction is imported into a new
// document) or an untitled document, and runs until the user quits. With
// --screenshot it draws the first window once, saves it as a PNG and quits:
// for documentation, bug reports and tests.

#include <CLI/CLI.hpp>
#include <QApplication>
#include <QFileDialog>
#include <cstdio>

#include "app/application.h"
#include "app/qt_gl_context.h"
#include "app/qt_platform.h"
#include "platform/class_registry.h"
#include "platform/log.h"
#include "scene/core_classes.h"

namespace {

// "WxH" with both sides 1..16384.
bool parseWindowSize(const std::string& text, int& width, int& height) {
  char extra = 0;
  return std::sscanf(text.c_str(), "%dx%d%c", &width, &height, &extra) == 2 && width > 0 &&
         height > 0 && width <= 16384 && height <= 16384;
}

}  // namespace

int main(int argc, char** argv) {
  // Every context of the application shares objects with every other, and
  // asks for the fixed-function pipeline the drawing code uses.
  QCoreApplication::setAttribute(Qt::AA_ShareOpenGLContexts);
  cloudreel::app::setDefaultSurfaceFormat();
  QApplication qtApplication(argc, argv);  // takes Qt's own options out of argv
  QApplication::setApplicationName(QStringLiteral("Cloudreel"));

  CLI::App cli{"Cloudreel: look at and animate large coloured point clouds.", "cloudreel-app"};
  cloudreel::app::Application::Options options;
  std::vector<std::string> files;
  std::string screenshot;
  std::string windowSize;
  bool verbose = false;
  cli.add_option("files", files,
                 "documents (.reel) to open; point files (.rwb, .ply) and "
                 "reconstructions (.out) are imported into a new document");
  cli.add_option("--screenshot", screenshot,
                 "draw the first window once, save it to this PNG file and quit");
  cli.add_option("--window-size", windowSize, "the windows' size as WxH (default 1024x768)");
  cli.add_flag("--verbose", verbose, "also show the core's diagnostic lines");
  try {
    cli.parse(QCoreApplication::arguments().size(), argv);
  } catch (const CLI::ParseError& error) {
    return cli.exit(error);
  }
  if (!windowSize.empty() &&
      !parseWindowSize(windowSize, options.windowWidth, options.windowHeight)) {
    std::fprintf(stderr, "cloudreel-app: --window-size must be WxH, e.g. 1280x720\n");
    return 2;
  }
  for (const auto& file : files) {
    options.files.emplace_back(file);
  }
  if (!screenshot.empty()) {
    options.screenshot = std::filesystem::absolute(screenshot);
  }
  cloudreel::setLogThreshold(verbose ? cloudreel::LogLevel::Debug : cloudreel::LogLevel::Warning);
  cloudreel::registerCoreClasses(cloudreel::ClassRegistry::shared());
  // A screenshot run asks nobody anything: errors go to standard error and
  // questions take their default answer.
  const bool unattended = !screenshot.empty();
  const auto dialogs = unattended ? nullptr : std::make_shared<cloudreel::app::QtUserInteraction>();
  const auto previousUser = cloudreel::UserInteraction::setShared(dialogs);

  int status = 0;
  {
    cloudreel::app::Application application(std::move(options));
    if (dialogs) {
      dialogs->setOpenPanelHook(
          [&application](QFileDialog& dialog) { application.customizeOpenPanel(dialog); });
    }
    if (!application.launch()) {
      status = application.exitStatus();
    } else {
      status = QApplication::exec();
    }
  }
  if (dialogs) {
    dialogs->setOpenPanelHook(nullptr);
  }
  cloudreel::UserInteraction::setShared(previousUser);
  return status;
}
