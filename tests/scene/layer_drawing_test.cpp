// The layer draw traversal seen in real pixels.
#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include "camera/scene_camera.h"
#include "platform/log.h"
#include "render/render_options.h"
#include "scene/layer.h"
#include "support/pixel_harness.h"

namespace cloudreel {
namespace {

using testing::Box;
using testing::Frame;
using testing::Rgba;

using LayerDrawingTest = testing::PixelTest;

// A layer whose content is a flat square of one colour in its xy plane.
class Square : public Layer {
 public:
  Square(Rgba colour, float side) : colour_(colour), side_(side) {}
  void drawGLWithOptions(const RenderOptions&) override {
    const float h = side_ / 2;
    glColor3ub(colour_.r, colour_.g, colour_.b);
    glBegin(GL_QUADS);
    glVertex3f(-h, -h, 0);
    glVertex3f(h, -h, 0);
    glVertex3f(h, h, 0);
    glVertex3f(-h, h, 0);
    glEnd();
  }

 private:
  Rgba colour_;
  float side_;
};

constexpr Rgba kGreen{0, 255, 0, 255};
constexpr Rgba kBlue{0, 0, 255, 255};

// A perspective projection with a 90° field of view and the near plane at 1.
void perspective() {
  glMatrixMode(GL_PROJECTION);
  glLoadIdentity();
  glFrustum(-1, 1, -1, 1, 1, 100);
  glMatrixMode(GL_MODELVIEW);
}

TEST_F(LayerDrawingTest, ChildrenAreDrawnInTheParentsFrameWhenVisibleWhateverTheParent) {
  auto parent = std::make_shared<Square>(kBlue, 20);
  parent->setIsVisible(false);
  parent->objectToWorld()->setTranslation({-30, 0, 0});
  auto shown = std::make_shared<Square>(testing::kRed, 10);
  // The traversal applies neither a child's own placement nor its billboard
  // mode: only the parent's frame counts.
  shown->objectToWorld()->setTranslation({100, 100, 0});
  shown->setIsInWorld(false);
  auto hidden = std::make_shared<Square>(kGreen, 30);
  hidden->setIsVisible(false);
  parent->addChildLayer(shown);
  parent->addChildLayer(hidden);

  const Frame frame = render(100, 100, [&] { parent->drawContentWithOptions(RenderOptions()); });
  EXPECT_EQ(frame.count(testing::kRed), 100);
  EXPECT_EQ(frame.count(kGreen), 0);
  EXPECT_EQ(frame.count(kBlue), 0);
  EXPECT_EQ(frame.boundsOf(testing::kRed), (Box{15, 45, 25, 55}));  // centred 30 left of 50
}

TEST_F(LayerDrawingTest, ABillboardStaysInFrontOfTheViewerWhileTheWorldMoves) {
  auto billboard = std::make_shared<Square>(testing::kRed, 1);
  billboard->setIsInWorld(false);
  billboard->setBillboardDistance(5);
  auto world = std::make_shared<Square>(kGreen, 2);

  struct View {
    std::array<double, 3> position;
    float heading;
  };
  // The world square stands at the origin; a camera 5 units along +z sees
  // it at the centre, one moved to +x sees it to the left, one turned away
  // does not see it at all.
  const struct {
    View view;
    std::optional<double> worldCentreX;
  } cases[] = {{{{0, 0, 5}, 0}, 50.0}, {{{2.5, 0, 5}, 0}, 25.0}, {{{0, 0, 5}, 180}, std::nullopt}};
  for (const auto& c : cases) {
    auto camera = std::make_shared<SceneCamera>();
    camera->setHeading(c.view.heading);
    camera->objectToWorld()->setTranslation(c.view.position);
    RenderOptions options;
    options.setSceneCamera(camera);
    const Frame frame = render(100, 100, [&] {
      perspective();
      billboard->drawContentWithOptions(options);
      world->drawContentWithOptions(options);
    });
    // 1 unit at distance 5 with a 90° view: 10 of 100 pixels.
    EXPECT_EQ(frame.count(testing::kRed), 100) << c.view.position[0];
    EXPECT_EQ(frame.boundsOf(testing::kRed), (Box{45, 45, 55, 55})) << c.view.position[0];
    const auto square = frame.boundsOf(kGreen);
    ASSERT_EQ(square.has_value(), c.worldCentreX.has_value());
    if (square) {
      EXPECT_NEAR((square->left + square->right) / 2.0, *c.worldCentreX, 0.5);
    }
  }
}

TEST_F(LayerDrawingTest, TheEditingGizmoShowsOnlyInEditorFrames) {
  auto layer = std::make_shared<Square>(testing::kRed, 10);
  layer->setIsVisible(false);
  layer->setIsEditing(true);
  layer->objectToWorld()->setToScale(40);  // the gizmo has the size of one unit
  RenderOptions editor;
  editor.setValueForKey(true, kRenderOptionEditor);
  RenderOptions rendered;
  rendered.setValueForKey(false, kRenderOptionEditor);

  const auto drawnWith = [&](const RenderOptions& options) {
    return render(100, 100, [&] { layer->drawContentWithOptions(options); }).countDrawn();
  };
  EXPECT_GT(drawnWith(editor), 200);
  EXPECT_EQ(drawnWith(rendered), 0);
  EXPECT_EQ(drawnWith(RenderOptions()), 0);
  layer->setIsEditing(false);
  EXPECT_EQ(drawnWith(editor), 0);
}

TEST_F(LayerDrawingTest, ALayerWithoutContentOfItsOwnShowsATeapotAndSaysSo) {
  Layer layer;
  layer.objectToWorld()->setToScale(30);
  CapturedLog log;
  const Frame frame = render(100, 100, [&] {
    glColor3ub(255, 255, 255);
    layer.drawContentWithOptions(RenderOptions());
  });
  EXPECT_GT(frame.countDrawn(), 300);
  EXPECT_EQ(log.count("defult drawGL!"), 1);
}

}  // namespace
}  // namespace cloudreel
