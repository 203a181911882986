#include "scene/animatable_3d_object.h"

#include <gtest/gtest.h>

#include "scene/archive_helpers.h"
#include "scene/layer.h"
#include "scene/my_document.h"

namespace cloudreel {
namespace {

// A document with one attached layer, and the end of each simulated user
// event.
struct Scene {
  MyDocument document;
  std::shared_ptr<Layer> layer = std::make_shared<Layer>();
  Scene() {
    document.addLayer(layer);
    endEvent();
    document.undoManager().removeAllActions();
  }
  void endEvent() { document.undoManager().closeEventGroup(); }
  UndoManager& undo() { return document.undoManager(); }
};

TEST(TransformUndo, EachPlacingTransformEditIsOneNamedStep) {
  const struct {
    const char* keyPath;
    double value;
    const char* actionName;
  } cases[] = {
      {"objectToWorld.scale", 2.0, "Scale"},
      {"objectToWorld.translationY", 4.0, "Translate"},
      {"inertialToObject.translationX", -1.5, "Translate"},
      {"inertialToObject.scale", 0.5, "Scale"},
  };
  for (const auto& c : cases) {
    Scene scene;
    // Away from the origin, so that a scale's undo must put the
    // translation back too.
    scene.layer->objectToWorld()->setTranslation({1, 2, 3});
    scene.layer->inertialToObject()->setTranslation({-1, 0, 2});
    const auto placed = scene.layer->objectToWorld()->mx();
    const auto oriented = scene.layer->inertialToObject()->mx();
    scene.layer->setValueForKeyPath(c.value, c.keyPath);
    scene.endEvent();
    EXPECT_EQ(scene.undo().undoActionName(), c.actionName) << c.keyPath;

    scene.undo().undo();
    for (std::size_t i = 0; i < 16; ++i) {
      EXPECT_NEAR(scene.layer->objectToWorld()->mx()[i], placed[i], 1e-6) << c.keyPath << i;
      EXPECT_NEAR(scene.layer->inertialToObject()->mx()[i], oriented[i], 1e-6) << c.keyPath << i;
    }
    EXPECT_FALSE(scene.undo().canUndo()) << c.keyPath;
    EXPECT_EQ(scene.undo().redoActionName(), c.actionName) << c.keyPath;

    scene.undo().redo();
    EXPECT_EQ(numberAs<double>(scene.layer->valueForKeyPath(c.keyPath)), c.value) << c.keyPath;
  }
}

TEST(TransformUndo, CommittingAnEditIsOneStepBackToThePlacementBeforeIt) {
  Scene scene;
  scene.layer->objectToWorld()->setTranslation({1, 0, 0});
  const auto placedBefore = scene.layer->objectToWorld()->mx();
  const auto orientedBefore = scene.layer->inertialToObject()->mx();

  // A drag: a move and a turn accumulate in the editing transforms.
  scene.layer->editingTransform()->setTranslation({0, 5, 0});
  scene.layer->editingOrigin()->setAxisAngleRotation({1.0, 0, 0, 1});
  scene.layer->applyEditingTransformNamed("Drag");
  scene.endEvent();

  EXPECT_EQ(scene.layer->editingTransform()->mx(), AffineTransform::kIdentity);
  EXPECT_EQ(scene.layer->editingOrigin()->mx(), AffineTransform::kIdentity);
  std::array<double, 3> t{};
  scene.layer->objectToWorld()->getTranslation(t);
  EXPECT_EQ(t, (std::array<double, 3>{1, 5, 0}));
  EXPECT_NE(scene.layer->inertialToObject()->mx(), orientedBefore);
  EXPECT_EQ(scene.undo().undoActionName(), "Drag");

  scene.undo().undo();
  EXPECT_EQ(scene.layer->objectToWorld()->mx(), placedBefore);
  EXPECT_EQ(scene.layer->inertialToObject()->mx(), orientedBefore);
  EXPECT_FALSE(scene.undo().canUndo());

  // The redo puts the committed placement back, and the transforms the undo
  // installed are observed: an edit of them is undoable again.
  scene.undo().redo();
  scene.layer->objectToWorld()->getTranslation(t);
  EXPECT_EQ(t, (std::array<double, 3>{1, 5, 0}));
  scene.layer->setValueForKeyPath(2.0, "objectToWorld.scale");
  scene.endEvent();
  EXPECT_EQ(scene.undo().undoActionName(), "Scale");
}

// A decoded layer and a copy are added to the document without their
// transforms observed: their edits are not undoable until the transforms are
// replaced.
TEST(TransformUndo, DecodedAndCopiedTransformsAreNotObservedUntilReplaced) {
  Scene scene;
  for (const auto& layer : {testing::roundTrip(std::make_shared<Layer>()), copyOf(*scene.layer)}) {
    ASSERT_TRUE(layer);
    scene.document.addLayer(layer);
    scene.endEvent();
    scene.undo().removeAllActions();
    layer->setValueForKeyPath(2.0, "objectToWorld.scale");
    scene.endEvent();
    EXPECT_FALSE(scene.undo().canUndo());

    layer->setObjectToWorldInertialToObject(std::make_shared<AffineTransform>(),
                                            std::make_shared<AffineTransform>());
    scene.endEvent();
    scene.undo().removeAllActions();
    layer->setValueForKeyPath(2.0, "objectToWorld.scale");
    scene.endEvent();
    EXPECT_EQ(scene.undo().undoActionName(), "Scale");
  }
}

}  // namespace
}  // namespace cloudreel
