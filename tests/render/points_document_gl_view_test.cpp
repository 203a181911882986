// The document view without a window: where known points land for each
// view mode and camera, the anaglyph channels per glasses type, the overlay
// text and guide, what keys, drags, gestures and the wheel do to the
// cameras and to the layer being edited (with their undo names), camera-path
// playback on a real run loop, and framing the scene.
#include "render/points_document_gl_view.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "camera/camera_framing.h"
#include "camera/discrete_camera_path.h"
#include "camera/scene_camera.h"
#include "render/gl/bitmap_font.h"
#include "scene/light_source.h"
#include "scene/point_layer.h"
#include "support/memory_defaults.h"
#include "support/pixel_harness.h"

namespace cloudreel {
namespace {

using testing::Box;
using testing::Frame;
using testing::Rgba;

constexpr int kW = 120;
constexpr int kH = 80;
constexpr Rgba kMarker{200, 100, 50, 255};

std::shared_ptr<PointLayer> layerOf(const std::vector<std::array<float, 3>>& points,
                                    Rgba colour = kMarker) {
  auto layer = std::make_shared<PointLayer>();
  const auto n = static_cast<std::int32_t>(points.size());
  layer->allocatePointArrayWithSize(n);
  layer->setNPoints(n);
  for (std::size_t i = 0; i < points.size(); ++i) {
    layer->colorPoints()[i] = {
        points[i][0], points[i][1], points[i][2], colour.r, colour.g, colour.b, 0};
  }
  layer->setPointSize(1.0f);
  return layer;
}

class DocumentViewTest : public testing::PixelTest {
 protected:
  void SetUp() override {
    testing::PixelTest::SetUp();
    view.setDocument(&document);
  }
  void TearDown() override {
    view.setDocument(nullptr);
    testing::PixelTest::TearDown();
  }
  Frame draw(int w = kW, int h = kH) {
    return render(w, h, [&] {
      view.prepare();
      view.reshape(w, h);
      view.drawFrame();
    });
  }
  // The one pixel of the marker colour; none when it is missing or spread.
  std::optional<std::array<int, 2>> marker(const Frame& frame, Rgba colour = kMarker) {
    const auto box = frame.boundsOf(colour);
    if (!box || box->width() != 1 || box->height() != 1) {
      return std::nullopt;
    }
    return std::array{box->left, box->top};
  }
  // A point that projects, in an orthographic view at orthoScale 0 (40
  // pixels a unit on a 120 × 80 frame), to the centre of pixel (px, row).
  static float orthoX(int px) { return (static_cast<float>(px) + 0.5f - 60.0f) / 40.0f; }
  static float orthoY(int row) { return (40.0f - static_cast<float>(row) - 0.5f) / 40.0f; }

  testing::MemoryDefaults defaults;
  MyDocument document;
  RunLoop loop;
  PointsDocumentGLView view{loop};
};

TEST_F(DocumentViewTest, APointLandsWhereTheSceneCamerasProjectionPutsIt) {
  // Scene camera at z = 15, 90° across the shorter side: at distance 10 the
  // view spans x in [-15, 15] and y in [-10, 10].
  document.sceneCamera()->setFieldOfView(90.0f);
  document.sceneCamera()->setZFar(50.0f);
  const auto at = [](int px, int row) {
    return std::array<float, 3>{static_cast<float>(((px + 0.5) / kW * 2 - 1) * 15),
                                static_cast<float>((1 - (row + 0.5) / kH * 2) * 10), 5.0f};
  };
  document.addLayer(layerOf({at(100, 12)}));
  EXPECT_EQ(marker(draw()), (std::array{100, 12}));
  // The same point through the free trackball camera (30°, at z = 15) lands
  // elsewhere; back to the scene camera it is where it was.
  view.setCameraMode(PointsDocumentGLView::kTrackballCamera);
  EXPECT_NE(marker(draw()), (std::array{100, 12}));
  view.setCameraMode(PointsDocumentGLView::kSceneCamera);
  EXPECT_EQ(marker(draw()), (std::array{100, 12}));
}

TEST_F(DocumentViewTest, OrthographicPresetsLookAlongTheirAxes) {
  // P = (x, y, z) at pixel-centre offsets; each preset shows it at the
  // turned position its axis implies.
  const float x = orthoX(80), y = orthoY(29), z = orthoX(90);
  document.addLayer(layerOf({{x, y, z}}));
  const struct {
    int axis;
    std::array<int, 2> pixel;
    std::string_view label;
  } cases[] = {
      {5, {80, 29}, "+Z"},        // as it is
      {2, {119 - 80, 29}, "-Z"},  // x mirrored
      {0, {90, 29}, "-X"},        // z shown across
      {3, {119 - 90, 29}, "+X"},  // -z shown across
      {1, {80, 70}, "-Y"},        // -z shown upwards
      {4, {80, 9}, "+Y"},         // z shown upwards
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.axis);
    view.cameraPreset(c.axis);
    EXPECT_EQ(view.viewMode(), PointsDocumentGLView::kOrthographic);
    EXPECT_EQ(PointsDocumentGLView::labelForOrthoAxis(c.axis), c.label);
    const auto found = marker(draw());
    ASSERT_TRUE(found);
    EXPECT_EQ(*found, c.pixel);
  }
  view.cameraPreset(9);  // logged, taken as axis 0
  EXPECT_EQ(view.orthoAxis(), 0);
}

TEST_F(DocumentViewTest, AnaglyphPassesWriteTheChannelsOfTheGlasses) {
  document.sceneCamera()->setFieldOfView(90.0f);
  // 10 units in front, at the centre of pixel (90, 20). Each pass slides it
  // 4 pixels (0.1 units at the near plane, 40 pixels a unit): the first to
  // the left, the second to the right.
  document.addLayer(layerOf({{7.625f, 4.875f, 5.0f}}, testing::kWhite));
  view.setViewMode(PointsDocumentGLView::kAnaglyph);
  EXPECT_TRUE(view.shouldDrawAnaglyph());
  view.setEyeSeparation(30.0f);
  constexpr Rgba R{255, 0, 0, 255}, G{0, 255, 0, 255}, B{0, 0, 255, 255}, GB{0, 255, 255, 255},
      W = testing::kWhite;
  const struct {
    int glasses;
    Rgba first, second;
  } cases[] = {{0, W, W}, {1, R, B}, {2, R, G},  {3, R, GB},
               {4, B, R}, {5, G, R}, {6, GB, R}, {7, W, W}};
  for (const auto& c : cases) {
    SCOPED_TRACE(c.glasses);
    view.setGlassesType(c.glasses);
    const Frame frame = draw();
    EXPECT_TRUE(testing::pixelIs(frame, 90 - 4, 20, c.first));
    EXPECT_TRUE(testing::pixelIs(frame, 90 + 4, 20, c.second));
  }
  view.setViewMode(PointsDocumentGLView::kNormal);
  EXPECT_FALSE(view.shouldDrawAnaglyph());
}

// The white pixels of the overlay line whose baseline is `baseline` pixels
// above the bottom.
std::vector<std::array<int, 2>> textLine(const Frame& frame, int baseline) {
  std::vector<std::array<int, 2>> pixels;
  for (int row = frame.height() - baseline - 10; row < frame.height() - baseline + 3; ++row) {
    for (int x = 0; x < frame.width(); ++x) {
      if (frame.at(x, row) == testing::kWhite) {
        pixels.push_back({x, row});
      }
    }
  }
  return pixels;
}

TEST_F(DocumentViewTest, TheOverlaySaysWhatIsShownAndTheGuideFramesSixteenByNine) {
  const auto reference = [&](std::string_view text, int baseline) {
    return textLine(render(kW, kH,
                           [&] {
                             glMatrixMode(GL_PROJECTION);
                             glLoadIdentity();
                             glOrtho(0, kW, 0, kH, -1, 1);
                             glMatrixMode(GL_MODELVIEW);
                             glLoadIdentity();
                             glColor3f(1, 1, 1);
                             glRasterPos2i(10, baseline);
                             gl::BitmapFont::drawString(text);
                           }),
                    baseline);
  };
  // Without editor helpers: the light's white wire sphere would cross the
  // third line.
  view.renderOptions().setValueForKey(false, kRenderOptionEditor);
  Frame frame = draw();
  EXPECT_EQ(textLine(frame, 10), reference("NO ERROR", 10));
  EXPECT_EQ(textLine(frame, 24), reference("PERSPECTIVE", 24));
  EXPECT_TRUE(textLine(frame, 38).empty());

  auto layer = layerOf({{0, 0, 0}});
  layer->setName("Hills");
  document.addLayer(layer);  // selects it
  view.setEditMode(PointsDocumentGLView::kEditSelectedLayer);
  view.cameraPreset(3);
  frame = draw();
  EXPECT_EQ(textLine(frame, 24), reference("+X", 24));
  EXPECT_EQ(textLine(frame, 38), reference("Edit: Hills", 38));

  // A 200 × 100 view is wider than 16:9: green half-bright columns at
  // x = (200 - 177.8) / 2 and 200 minus that.
  frame = draw(200, 100);
  const auto green = [](Rgba c) { return c.r == 0 && c.b == 0 && c.g >= 120 && c.g <= 135; };
  // (The top half: the text below blends with the left line.)
  EXPECT_EQ(frame.count(green, Box{11, 0, 12, 50}), 50);
  EXPECT_EQ(frame.count(green, Box{188, 0, 189, 50}), 50);
  EXPECT_EQ(frame.count(green, Box{20, 0, 180, 50}), 0);
  // Exactly 16:9 puts the lines on the bottom and top edges.
  const auto lines = PointsDocumentGLView::guideLinesForSize(160, 90);
  EXPECT_NEAR(lines[0].y0, 0.0, 1e-5);
  EXPECT_NEAR(lines[1].y0, 90.0, 1e-5);
  EXPECT_DOUBLE_EQ(lines[1].x1, 160.0);
}

TEST(DocumentViewText, GLErrorsReadAsTheirNames) {
  EXPECT_EQ(PointsDocumentGLView::textForGLError(0), "NO ERROR");
  EXPECT_EQ(PointsDocumentGLView::textForGLError(0x0502), "GL ERROR 0x502: GL_INVALID_OPERATION");
  EXPECT_EQ(PointsDocumentGLView::textForGLError(0x0504), "GL ERROR 0x504: GL_STACK_UNDERFLOW");
  EXPECT_EQ(PointsDocumentGLView::textForGLError(0x0506), "GL ERROR 0x506: UNKNOWN");
}

TEST(DocumentViewPresets, TheNearestPresetKeepsTheEarlierCandidateOnATie) {
  // Elements 8, 9 and 10 are the z components of the X, Y and Z rows.
  const struct {
    double xz, yz, zz;
    int axis;
  } cases[] = {{0, 0, 1, 2},      {0, 1, 0, 1},      {1, 0, 0, 0},     {0, 0, -1, 5},
               {0, -1, 0, 4},     {-1, 0, 0, 3},     {0, 0.5, 0.5, 2}, {0.5, 0.5, 0, 1},
               {0, -0.5, 0.5, 2}, {-0.5, 0, -0.5, 5}};
  for (const auto& c : cases) {
    AffineTransform m;
    auto mx = m.mx();
    mx[8] = c.xz;
    mx[9] = c.yz;
    mx[10] = c.zz;
    m.setDoubles(mx);
    EXPECT_EQ(PointsDocumentGLView::nearestOrthoAxisForMatrix(m), c.axis)
        << c.xz << " " << c.yz << " " << c.zz;
  }
}

TEST_F(DocumentViewTest, KeysMoveTheOrthographicViewAndSwitchModes) {
  document.addLayer(layerOf({{orthoX(70), orthoY(20), 0}}));
  view.keyDown("#");
  EXPECT_EQ(view.viewMode(), PointsDocumentGLView::kOrthographic);
  EXPECT_EQ(marker(draw()), (std::array{70, 20}));
  view.keyDown("a");
  view.keyDown("a", true);  // a repeat does nothing
  view.keyDown("c");
  EXPECT_EQ(marker(draw()), (std::array{90, 0}));  // 0.5 units right, 0.5 up
  view.keyDown("d");
  view.keyDown("z");
  EXPECT_EQ(marker(draw()), (std::array{70, 20}));
  view.keyDown("=");
  EXPECT_EQ(view.orthoScale(), 1.0f);
  view.keyDown("-");
  view.keyDown("-");
  EXPECT_EQ(view.orthoScale(), -1.0f);
  view.keyDown("1");
  EXPECT_EQ(view.orthoAxis(), 0);
  view.keyDown(" ");
  EXPECT_TRUE(view.isPanningKeyDown());
  view.keyUp(" ");
  EXPECT_FALSE(view.isPanningKeyDown());
  view.keyDown("~");
  EXPECT_EQ(view.viewMode(), PointsDocumentGLView::kNormal);
  view.keyDown(" ");  // the pan key is only for the orthographic view
  EXPECT_FALSE(view.isPanningKeyDown());
  // While editing, the navigation keys leave the view alone.
  view.setEditMode(PointsDocumentGLView::kEditSelectedLayer);
  view.keyDown("w");
  EXPECT_EQ(view.keyboardTranslation(), (std::array<double, 3>{0, 0, 0}));
  view.keyDown("q");
  EXPECT_EQ(view.editMode(), PointsDocumentGLView::kNoEditing);
  view.keyDown("w");
  EXPECT_EQ(view.keyboardTranslation(), (std::array<double, 3>{0, 0, 0.5}));
}

TEST_F(DocumentViewTest, ADragPansTheOrthographicViewWithThePointerAtAnyZoom) {
  document.addLayer(layerOf({{orthoX(70), orthoY(20), 0}}));
  view.cameraPreset(5);
  for (const float scale : {0.0f, -2.0f}) {
    SCOPED_TRACE(scale);
    view.setOrthoScale(scale);
    const auto before = marker(draw());
    ASSERT_TRUE(before);
    view.reshape(kW, kH);
    view.mouseDown({60, 40});
    view.mouseDragged({65, 35});
    view.mouseUp({70, 30});  // 10 right, 10 down (the pointer's y grows upwards)
    EXPECT_EQ(marker(draw()), (std::array{(*before)[0] + 10, (*before)[1] + 10}));
    EXPECT_FALSE(view.isPanning());
  }
}

TEST_F(DocumentViewTest, TrackballDragsTurnTheFreeCameraAndRightDragsDolly) {
  document.addLayer(layerOf({{2, 0.2f, 0}}));
  view.setCameraMode(PointsDocumentGLView::kTrackballCamera);
  const auto before = marker(draw());
  ASSERT_TRUE(before);
  view.mouseDown({40, 40});
  view.mouseDragged({60, 40});
  EXPECT_NE(view.trackball().intermediate()[0], 0.0);
  view.mouseUp({80, 40});
  EXPECT_EQ(view.trackball().intermediate()[0], 0.0);
  EXPECT_NE(view.trackball().rotation()[0], 0.0);
  const auto after = marker(draw());
  ASSERT_TRUE(after);
  EXPECT_NE((*after)[0], (*before)[0]);
  EXPECT_NEAR((*after)[1], (*before)[1], 2);

  // Up by half the shorter side moves the looked-through camera 10 units
  // forwards: the scene camera along -z.
  view.setCameraMode(PointsDocumentGLView::kSceneCamera);
  view.rightMouseDown({10, 10});
  view.rightMouseDragged({10, 30});
  view.rightMouseUp({10, 50});
  EXPECT_FLOAT_EQ(document.sceneCamera()->positionZ(), 5.0f);
  // In the orthographic view the same drag zooms in by one step.
  view.cameraPreset(5);
  view.rightMouseDown({10, 10});
  view.rightMouseUp({10, 50});
  EXPECT_FLOAT_EQ(view.orthoScale(), 1.0f);
}

// In a turned view a drag moves the layer along the view's own axes: the
// "+X" preset turns 270 degrees about y, so the view's right is world -z.
TEST_F(DocumentViewTest, ATranslateDragFollowsTheTurnedViewsAxes) {
  auto layer = layerOf({{0, 0, 0}});
  document.addLayer(layer);
  view.reshape(kW, kH);
  view.setEditMode(PointsDocumentGLView::kEditSelectedLayer);
  view.cameraPreset(3);
  std::array<double, 3> before{0, 0, 0};
  layer->objectToWorld()->multiply3Vector(before);
  view.mouseDown({60, 40});
  view.mouseUp({80, 80});  // 20 pixels right and 40 up: 0.5 and 1 unit
  std::array<double, 3> after{0, 0, 0};
  layer->objectToWorld()->multiply3Vector(after);
  EXPECT_NEAR(after[0] - before[0], 0.0, 1e-9);
  EXPECT_NEAR(after[1] - before[1], 1.0, 1e-9);
  EXPECT_NEAR(after[2] - before[2], -0.5, 1e-9);
}

TEST_F(DocumentViewTest, EditDragsCommitUnderTheirUndoNames) {
  auto layer = layerOf({{0, 0, 0}});
  document.addLayer(layer);
  document.undoManager().closeEventGroup();
  view.reshape(kW, kH);
  view.setEditMode(PointsDocumentGLView::kEditSelectedLayer);
  EXPECT_TRUE(layer->isEditing());
  EXPECT_EQ(view.viewMode(), PointsDocumentGLView::kOrthographic);
  view.cameraPreset(5);  // the view's axes are the world's

  // A click is no edit.
  view.mouseDown({60, 40});
  view.mouseUp({60, 40});
  document.undoManager().closeEventGroup();
  EXPECT_EQ(document.undoManager().undoActionName(), "New Layer");

  const struct {
    ViewModifiers modifiers;
    std::string_view name;
  } cases[] = {{{}, "Translate"},
               {{.shift = true}, "Scale"},
               {{.command = true}, "Rotate"},
               {{.shift = true, .command = true}, "Re-Origin"}};
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    const auto placed = [&](std::array<double, 3> p) {
      layer->inertialToObject()->multiply3Vector(p);
      layer->objectToWorld()->multiply3Vector(p);
      return p;
    };
    const auto cornerBefore = placed({1, 1, 1});
    view.mouseDown({60, 40}, c.modifiers);
    view.mouseDragged({70, 60});
    view.mouseUp({80, 80});  // 20 pixels right and 40 up: 0.5 and 1 unit
    document.undoManager().closeEventGroup();
    EXPECT_EQ(document.undoManager().undoActionName(), c.name);
    const auto cornerAfter = placed({1, 1, 1});
    if (c.name == "Translate") {
      EXPECT_NEAR(cornerAfter[0] - cornerBefore[0], 0.5, 1e-9);
      EXPECT_NEAR(cornerAfter[1] - cornerBefore[1], 1.0, 1e-9);
    } else if (c.name == "Scale") {
      EXPECT_NEAR(layer->inertialToObject()->scale(), 2.0, 1e-5);
    } else if (c.name == "Re-Origin") {
      // The content stays; the origin moved.
      for (int i = 0; i < 3; ++i) {
        EXPECT_NEAR(cornerAfter[i], cornerBefore[i], 1e-9);
      }
      EXPECT_NEAR(layer->objectToWorld()->translationX(), 0.5, 1e-5);
      EXPECT_NEAR(layer->objectToWorld()->translationY(), 1.0, 1e-5);
    } else {
      EXPECT_NE(cornerAfter, cornerBefore);
    }
    document.undoManager().undo();
    const auto undone = placed({1, 1, 1});
    for (int i = 0; i < 3; ++i) {
      EXPECT_NEAR(undone[i], cornerBefore[i], 1e-9);
    }
  }

  // A pinch while editing scales, committed at the gesture's end.
  view.magnify(1.0);
  view.endGesture();
  document.undoManager().closeEventGroup();
  EXPECT_EQ(document.undoManager().undoActionName(), "trackpad gesture");
  EXPECT_NEAR(layer->inertialToObject()->scale(), 2.0, 1e-5);

  // Leaving the orthographic view ends editing.
  view.setViewMode(PointsDocumentGLView::kNormal);
  EXPECT_EQ(view.editMode(), PointsDocumentGLView::kNoEditing);
  EXPECT_FALSE(layer->isEditing());
  // A locked layer cannot be edited; the light can.
  layer->setIsLocked(true);
  view.setEditMode(PointsDocumentGLView::kEditSelectedLayer);
  EXPECT_EQ(view.editMode(), PointsDocumentGLView::kNoEditing);
  view.setEditMode(PointsDocumentGLView::kEditLight);
  EXPECT_EQ(view.editingLayer(), document.lightSource());
}

TEST_F(DocumentViewTest, ThePinchAndTheWheelZoomByViewMode) {
  const float fov = document.sceneCamera()->fieldOfView();
  view.scrollWheel(1.0);
  EXPECT_FLOAT_EQ(document.sceneCamera()->fieldOfView(), fov + 2.0f);
  view.magnify(1.0, {.command = true});  // ignored
  EXPECT_FLOAT_EQ(document.sceneCamera()->fieldOfView(), fov + 2.0f);
  view.magnify(100.0);  // held where the projection still exists
  EXPECT_FLOAT_EQ(document.sceneCamera()->fieldOfView(), 179.0f);
  view.magnify(-100.0);
  EXPECT_FLOAT_EQ(document.sceneCamera()->fieldOfView(), 1.0f);
  view.cameraPreset(5);
  view.scrollWheel(-5.0);
  EXPECT_FLOAT_EQ(view.orthoScale(), -0.5f);
}

std::shared_ptr<DiscreteCameraPath> threeFramePath() {
  std::string text = "3\n";
  for (int i = 0; i < 3; ++i) {
    text += "1 0 0 0 0 1 0 0 0 0 1 " + std::to_string(i) + " 0 0 0 1\n";
  }
  auto path = DiscreteCameraPath::initWithText(text);
  EXPECT_EQ(path->nFrames(), 3);
  return path;
}

TEST_F(DocumentViewTest, PlaybackStepsThroughThePathAndStopsOrLoops) {
  std::vector<std::int32_t> frames;
  CallbackObserver observer([&](std::string_view, Object&, const Change&, std::string_view) {
    frames.push_back(view.animframe());
  });
  view.addObserver(observer, "animframe", ObservingOptions::None, "");
  view.setFramesPerSecond(200.0f);
  const auto path = threeFramePath();
  view.beginAnimatingWithCameraPath(path);
  EXPECT_EQ(view.cameraMode(), PointsDocumentGLView::kCameraPathOrTrackball);
  ASSERT_TRUE(loop.runUntil([&] { return !view.isAnimating(); }, std::chrono::seconds(5)));
  EXPECT_EQ(frames, (std::vector<std::int32_t>{-1, 0, 1, 2, 3, 0}));
  EXPECT_EQ(view.cameraMode(), PointsDocumentGLView::kSceneCamera);

  // Looping: the frame after the last is frame 0, through -1.
  frames.clear();
  view.setLoopAnimation(true);
  view.beginAnimatingWithCameraPath(path);
  ASSERT_TRUE(loop.runUntil([&] { return frames.size() >= 9; }, std::chrono::seconds(5)));
  EXPECT_EQ(std::vector<std::int32_t>(frames.begin(), frames.begin() + 9),
            (std::vector<std::int32_t>{-1, 0, 1, 2, 3, -1, 0, 1, 2}));
  // While playing, the view looks through the path's camera.
  EXPECT_FLOAT_EQ(view.currentCamera()->positionX(),
                  path->cameraInWorldSpaceForFrame(view.animframe())->positionX());
  view.stopAnimating();
  EXPECT_FALSE(view.isAnimating());
  EXPECT_EQ(view.animframe(), 0);

  // Single steps wrap at the end without a timer.
  view.advanceFrameForCameraPath(path);
  EXPECT_EQ(view.animframe(), 0);
  view.advanceFrameForCameraPath(path);
  view.advanceFrameForCameraPath(path);
  view.advanceFrameForCameraPath(path);
  EXPECT_EQ(view.animframe(), 0);
  EXPECT_EQ(path->currentFrame(), 0);
  view.stopAnimating();

  // No path, or no usable rate: nothing starts.
  view.beginAnimatingWithCameraPath(nullptr);
  EXPECT_FALSE(view.isAnimating());
  view.setFramesPerSecond(0.0f);
  view.beginAnimatingWithCameraPath(path);
  EXPECT_FALSE(view.isAnimating());
  view.removeObserver(observer, "animframe");
}

TEST_F(DocumentViewTest, FrameSceneBringsEveryVisibleLayerIntoViewUndoably) {
  std::vector<std::array<float, 3>> corners;
  for (int i = 0; i < 8; ++i) {
    corners.push_back({(i & 1) ? 1.0f : -1.0f, (i & 2) ? 1.0f : -1.0f, (i & 4) ? 1.0f : -1.0f});
  }
  auto layer = layerOf(corners);
  layer->setBoundingBox({-1, -1, -1, 1, 1, 1});
  layer->objectToWorld()->setTranslation({30, 0, 0});
  document.addLayer(layer);
  auto hidden = layerOf({{0, 0, 0}});
  hidden->setBoundingBox({-500, -500, -500, 500, 500, 500});
  hidden->setIsVisible(false);
  document.addLayer(hidden);
  document.undoManager().closeEventGroup();
  // Large enough that no corner lies under the overlay text.
  const auto frame = [&] { return draw(400, 300); };
  EXPECT_EQ(frame().count(kMarker), 0);

  view.frameScene();
  document.undoManager().closeEventGroup();
  EXPECT_EQ(frame().count(kMarker), 8);
  EXPECT_EQ(document.undoManager().undoActionName(), "Frame Scene");
  // The hidden layer's huge box did not count: the camera is close.
  EXPECT_LT(document.sceneCamera()->positionZ(), 20.0f);
  document.undoManager().undo();
  EXPECT_FLOAT_EQ(document.sceneCamera()->positionX(), 0.0f);
  EXPECT_FLOAT_EQ(document.sceneCamera()->positionZ(), 15.0f);
  document.undoManager().redo();
  EXPECT_EQ(frame().count(kMarker), 8);

  // Nothing visible: nothing moves and nothing is registered.
  layer->setIsVisible(false);
  document.undoManager().closeEventGroup();
  const auto before = document.undoManager().undoActionName();
  const float x = document.sceneCamera()->positionX();
  view.frameScene();
  EXPECT_EQ(document.sceneCamera()->positionX(), x);
  EXPECT_EQ(document.undoManager().undoActionName(), before);
}

TEST(CameraFraming, ATurnedCameraBacksAwayAlongItsOwnView) {
  const Layer::BoundingBox box{-1, -1, -1, 1, 1, 1};
  SceneCamera straight;
  SceneCamera turned;
  turned.setHeading(90.0f);
  const auto a = framingOfBoxForCamera(straight, box);
  const auto b = framingOfBoxForCamera(turned, box);
  EXPECT_NEAR(a.position[0], 0.0, 1e-9);
  EXPECT_GT(a.position[2], 1.0);
  EXPECT_NEAR(std::abs(b.position[0]), a.position[2], 1e-6);
  EXPECT_NEAR(b.position[2], 0.0, 1e-6);
  // A box without size, or with a NaN, leaves the camera where it is.
  EXPECT_EQ(framingOfBoxForCamera(straight, {1, 1, 1, 1, 1, 1}).position,
            (std::array<double, 3>{0, 0, 0}));
  EXPECT_FALSE(isFramableBox({0, 0, 0, NAN, 1, 1}));
}

TEST_F(DocumentViewTest, AViewWithoutAreaIsOnlyCleared) {
  document.addLayer(layerOf({{0, 0, 5}}));
  for (const auto mode : {0, 1, 2}) {
    view.setViewMode(mode);
    // The harness fails the test on any GL error the frame leaves.
    const Frame frame = render(kW, kH, [&] {
      view.reshape(0, 50);
      view.drawFrame();
    });
    EXPECT_EQ(frame.countDrawn(), 0);
  }
  view.reshape(kW, kH);
  view.setDocument(nullptr);
  EXPECT_EQ(draw().countDrawn(), 0);
}

}  // namespace
}  // namespace cloudreel
