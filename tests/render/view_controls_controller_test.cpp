#include "render/view_controls_controller.h"

#include <gtest/gtest.h>

#include <cmath>

#include "camera/slerp_camera_path.h"
#include "camera/transform_stack.h"
#include "render/points_document_gl_view.h"
#include "scene/my_document.h"
#include "support/memory_defaults.h"

namespace cloudreel {
namespace {

TEST(ViewControlsController, SettingsGoToTheViewAndTheViewsOwnChangesAreHeard) {
  testing::MemoryDefaults defaults;
  RunLoop loop;
  auto document = std::make_shared<MyDocument>();
  auto view = std::make_shared<PointsDocumentGLView>(loop);
  view->setDocument(document.get());
  ViewControlsController controls;
  int reloads = 0;
  controls.setReloadHandler([&] { ++reloads; });

  // Without a view every setter is harmless.
  controls.setViewMode(PointsDocumentGLView::kAnaglyph);
  controls.play();
  EXPECT_EQ(controls.viewMode(), PointsDocumentGLView::kNormal);

  controls.setDocument(document);
  controls.setView(view);
  controls.setViewMode(PointsDocumentGLView::kAnaglyph);
  EXPECT_TRUE(view->shouldDrawAnaglyph());
  controls.setGlassesType(9);
  EXPECT_EQ(view->glassesType(), 6);
  controls.setGlassesType(-3);
  EXPECT_EQ(view->glassesType(), 1);
  controls.setEyeSeparation(2.5f);
  controls.setEyeSeparation(std::nanf(""));
  EXPECT_EQ(view->eyeSeparation(), 2.5f);
  controls.setFramesPerSecond(0.0f);
  EXPECT_EQ(view->framesPerSecond(), 1.0f);
  controls.setCameraMode(PointsDocumentGLView::kSelectedCamera);
  EXPECT_EQ(view->cameraMode(), PointsDocumentGLView::kSelectedCamera);

  // A key in the view changes its mode: the panel hears of it.
  reloads = 0;
  view->keyDown("~");
  EXPECT_GT(reloads, 0);
  EXPECT_EQ(controls.viewMode(), PointsDocumentGLView::kNormal);

  // A view that goes leaves the controls with none.
  view->setDocument(nullptr);
  view.reset();
  EXPECT_EQ(controls.view(), nullptr);
  controls.setViewMode(PointsDocumentGLView::kAnaglyph);
  EXPECT_FALSE(controls.isPlaying());
}

TEST(ViewControlsController, PlaysStepsAndStopsTheChosenPathInTheView) {
  testing::MemoryDefaults defaults;
  RunLoop loop;
  auto document = std::make_shared<MyDocument>();
  auto view = std::make_shared<PointsDocumentGLView>(loop);
  view->setDocument(document.get());
  ViewControlsController controls;
  controls.setDocument(document);
  controls.setView(view);

  // The tree's paths, then stored ones not in the tree, then the stacks.
  auto inTree = std::make_shared<SLERPCameraPath>();
  inTree->setName("tree");
  auto stored = std::make_shared<SLERPCameraPath>();
  stored->setName("stored");
  document->addLayer(inTree);
  document->addCameraPath(inTree);
  document->addCameraPath(stored);
  EXPECT_EQ(controls.playablePathTitles(),
            (std::vector<std::string>{"tree", "stored", "New stack"}));
  EXPECT_EQ(controls.selectedPathIndex(), 0u);

  controls.selectPath(1);
  controls.selectPath(9);  // outside: the choice stays
  EXPECT_EQ(controls.selectedPathIndex(), 1u);
  controls.step();
  EXPECT_EQ(view->cameraPath(), stored);
  EXPECT_EQ(controls.animframe(), 0);
  controls.step();
  EXPECT_EQ(controls.animframe(), 1);

  controls.setFramesPerSecond(200.0f);
  controls.play();
  EXPECT_TRUE(controls.isPlaying());
  EXPECT_TRUE(loop.runUntil([&] { return controls.animframe() >= 2; }, std::chrono::seconds(5)));
  controls.stop();
  EXPECT_FALSE(controls.isPlaying());

  // The render takes the chosen path as the document's selected layer.
  ASSERT_TRUE(controls.selectPathForRender());
  EXPECT_EQ(document->selectedLayer(), stored);

  // Another document forgets the choice; one without paths has none to play.
  auto empty = std::make_shared<MyDocument>();
  empty->setTransformStacks({});
  controls.setDocument(empty);
  EXPECT_EQ(controls.selectedPathIndex(), std::nullopt);
  EXPECT_FALSE(controls.selectPathForRender());
  view->setDocument(nullptr);
}

}  // namespace
}  // namespace cloudreel
