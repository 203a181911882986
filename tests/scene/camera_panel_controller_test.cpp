#include "scene/camera_panel_controller.h"

#include <gtest/gtest.h>

#include <string>

#include "camera/camera_field.h"
#include "camera/scene_camera.h"
#include "import/bundler_file.h"
#include "scene/my_document.h"
#include "support/memory_defaults.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

using testing::writeFile;

// Looks at the origin from (0, 0, 5).
const std::string kCamera = "500 0 0\n1 0 0\n0 1 0\n0 0 1\n0 0 -5\n";

// A reconstruction of three cameras and no points under root/bundle, whose
// list.txt names a readable photograph for camera 0, a missing one for
// camera 1 and nothing for camera 2.
std::shared_ptr<BundlerFile> writeReconstruction(const testing::TempDir& root) {
  std::filesystem::create_directories(root / "images");
  writeFile(root / "images/a.ppm", std::string("P6\n4 2\n255\n") + std::string(4 * 2 * 3, '\x7f'));
  writeFile(root / "list.txt", "images/a.ppm 0 1234.5\nimages/gone.jpg\n");
  const auto url = writeFile(root / "bundle/bundle.out",
                             "# Bundle file v0.3\n3 0\n" + kCamera + kCamera + kCamera);
  return BundlerFile::initWithURLShouldLink(url, false);
}

std::shared_ptr<CameraField> fieldOf(const BundlerFile& layer) {
  return std::dynamic_pointer_cast<CameraField>(layer.childLayers().at(0));
}

TEST(CameraPanelController, ListsTheSceneCameraAndEachFieldOnceAndFollowsTheDocument) {
  testing::MemoryDefaults defaults;
  const testing::TempDir root;
  auto document = std::make_shared<MyDocument>();
  CameraPanelController panel;
  int reloads = 0;
  panel.setReloadHandler([&] { ++reloads; });
  EXPECT_TRUE(panel.groups().empty());

  panel.setDocument(document);
  ASSERT_EQ(panel.groups().size(), 1u);
  EXPECT_EQ(panel.groups()[0].rows.at(0).camera, document->sceneCamera());

  // An import puts its field in the tree and in the stored paths: listed once.
  const auto layer = writeReconstruction(root);
  ASSERT_TRUE(layer);
  document->addLayer(layer);
  document->addCameraPath(fieldOf(*layer));
  ASSERT_EQ(panel.groups().size(), 2u);
  const auto& group = panel.groups()[1];
  EXPECT_EQ(group.field, fieldOf(*layer));
  ASSERT_EQ(group.rows.size(), 3u);
  EXPECT_EQ(group.rows[0].title, "Camera 0");
  EXPECT_EQ(group.rows[0].detail, "a.ppm");
  EXPECT_EQ(group.rows[2].detail, "");
  EXPECT_GE(reloads, 2);

  // Undoing the import empties the list again; another document replaces it.
  document->undoManager().undo();
  EXPECT_EQ(panel.groups().size(), 1u);
  panel.setDocument(nullptr);
  EXPECT_TRUE(panel.groups().empty());
  EXPECT_FALSE(panel.selectCameraAt({0, 0}));
}

TEST(CameraPanelController, ChoosingACameraSelectsItForTheViewAndAnswersItsPhotograph) {
  testing::MemoryDefaults defaults;
  const testing::TempDir root;
  auto document = std::make_shared<MyDocument>();
  const auto layer = writeReconstruction(root);
  document->addLayer(layer);
  CameraPanelController panel;
  panel.setDocument(document);
  const auto& cameras = fieldOf(*layer)->cameras();

  EXPECT_EQ(panel.photographPath(), std::nullopt);
  ASSERT_TRUE(panel.selectCameraAt({1, 0}));
  EXPECT_EQ(document->selectedCamera(), cameras[0]);
  EXPECT_TRUE(cameras[0]->selected());
  EXPECT_EQ(panel.selectedPosition(), (CameraPanelController::Position{1, 0}));
  // The file list.txt names, relative to the reconstruction's root folder.
  ASSERT_TRUE(panel.photographPath());
  EXPECT_TRUE(std::filesystem::equivalent(*panel.photographPath(), root / "images/a.ppm"));

  // A named photograph that cannot be read is still answered, so the
  // window can say which file is missing; a camera without one answers none.
  ASSERT_TRUE(panel.selectCameraAt({1, 1}));
  EXPECT_FALSE(cameras[0]->selected());  // only one camera shows its photograph
  EXPECT_EQ(panel.photographPath()->filename(), "gone.jpg");
  ASSERT_TRUE(panel.selectCameraAt({1, 2}));
  EXPECT_EQ(panel.photographPath(), std::nullopt);

  // The scene camera is a plain camera: no photograph.
  ASSERT_TRUE(panel.selectCameraAt({0, 0}));
  EXPECT_EQ(document->selectedCamera(), document->sceneCamera());
  EXPECT_EQ(panel.photographPath(), std::nullopt);

  // Places outside the lists change nothing.
  EXPECT_FALSE(panel.selectCameraAt({1, 3}));
  EXPECT_FALSE(panel.selectCameraAt({2, 0}));
  EXPECT_EQ(document->selectedCamera(), document->sceneCamera());
  panel.clearSelection();
  EXPECT_EQ(document->selectedCamera(), nullptr);
  EXPECT_EQ(panel.selectedPosition(), std::nullopt);
}

}  // namespace
}  // namespace cloudreel
