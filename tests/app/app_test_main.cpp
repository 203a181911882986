// The desktop application's tests run in one program with one QApplication,
// its contexts sharing objects as the application's do.

#include <gtest/gtest.h>

#include <QApplication>

#include "app/qt_gl_context.h"
#include "platform/class_registry.h"
#include "scene/core_classes.h"

int main(int argc, char** argv) {
  QCoreApplication::setAttribute(Qt::AA_ShareOpenGLContexts);
  cloudreel::app::setDefaultSurfaceFormat();
  QApplication application(argc, argv);
  cloudreel::registerCoreClasses(cloudreel::ClassRegistry::shared());
  ::testing::InitGoogleTest(&argc, argv);
  return RUN_ALL_TESTS();
}
