// The primitive, marker and light layers: their model behaviour, and what
// they draw in real pixels.
#include "scene/sphere.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <array>
#include <functional>
#include <numbers>
#include <string>
#include <tuple>

#include "platform/log.h"
#include "render/render_options.h"
#include "scene/archive_helpers.h"
#include "scene/light_source.h"
#include "scene/my_document.h"
#include "scene/point_3d.h"
#include "support/pixel_harness.h"

namespace cloudreel {
namespace {

using testing::Box;
using testing::Frame;
using testing::roundTrip;

std::shared_ptr<Sphere> primitive(std::int32_t shape, float size, std::int32_t segments = 64) {
  auto sphere = std::make_shared<Sphere>();
  sphere->setShape(shape);
  sphere->setSize(size);
  sphere->setSegments(segments);
  return sphere;
}

// What a primitive is, in one comparable value: name, shape, size, segments.
auto described(const Sphere& s) { return std::tuple(s.name(), s.shape(), s.size(), s.segments()); }

TEST(Sphere, ChoosingAShapeNamesTheLayerAndDecidesWhetherSegmentsAreOffered) {
  const struct {
    std::int32_t shape;
    std::string name;
    bool hasSegments;
  } cases[] = {{0, "Sphere", true},     {1, "Cube", false},      {2, "Teapot", false},
               {3, "Cone", false},      {4, "Plane", false},     {5, "<UNKNOWN>", true},
               {7, "<UNKNOWN>", false}, {-1, "<UNKNOWN>", false}};
  for (const auto& c : cases) {
    auto sphere = std::make_shared<Sphere>();
    sphere->setName("Mine");
    // The properties panel follows the derived flag by observing it.
    std::optional<Value> announced;
    CallbackObserver panel([&](std::string_view, Object&, const Change& change, std::string_view) {
      announced = change.newValue;
    });
    sphere->addObserver(panel, "selectedObjectHasSegments", ObservingOptions::New, "");
    sphere->setValueForKey(c.shape, "shape");
    EXPECT_EQ(sphere->name(), c.name) << "shape " << c.shape;
    EXPECT_EQ(sphere->selectedObjectHasSegments(), c.hasSegments) << "shape " << c.shape;
    EXPECT_EQ(announced, std::optional<Value>(c.hasSegments)) << "shape " << c.shape;
  }
}

TEST(Sphere, EditsThroughTheDocumentUndoAndRedoUnderTheirNames) {
  const struct {
    std::string key;
    std::function<void(Sphere&)> change;
    std::string actionName;
  } cases[] = {
      {"shape", [](Sphere& s) { s.setShape(Sphere::kShapeSphere); }, "Change Shape"},
      {"size", [](Sphere& s) { s.setSize(2.5f); }, "Change Size"},
      {"segments", [](Sphere& s) { s.setSegments(8); }, "Change Segments"},
      {"color", [](Sphere& s) { s.setColor(Color::colorWithRGBA(1, 0, 0)); }, "Change Colour"},
  };
  for (const auto& c : cases) {
    MyDocument document;
    const auto sphere = std::make_shared<Sphere>();
    document.addLayer(sphere);
    document.undoManager().closeEventGroup();
    const Value before = sphere->valueForKey(c.key);
    c.change(*sphere);
    document.undoManager().closeEventGroup();
    const Value after = sphere->valueForKey(c.key);
    ASSERT_NE(before, after) << c.key;

    EXPECT_EQ(document.undoManager().undoActionName(), c.actionName);
    document.undoManager().undo();
    EXPECT_EQ(sphere->valueForKey(c.key), before) << c.key;
    EXPECT_EQ(sphere->name(), "Teapot") << c.key;
    document.undoManager().redo();
    EXPECT_EQ(sphere->valueForKey(c.key), after) << c.key;
  }
}

// A copy is named after its shape; an archive keeps the name it was saved
// with.
TEST(Sphere, CopiesAndArchivesKeepEveryPropertyAndOnlyArchivesTheName) {
  auto ball = primitive(Sphere::kShapeWireSphere, 2.5f, 7);
  ball->setName("Ball");
  ball->setColor(Color::colorWithRGBA(0.25f, 0.5f, 0.75f, 0.5f));
  const std::pair<std::shared_ptr<Sphere>, std::string> cases[] = {{copyOf(*ball), "<UNKNOWN>"},
                                                                   {roundTrip(ball), "Ball"}};
  for (const auto& [back, name] : cases) {
    ASSERT_TRUE(back);
    EXPECT_EQ(back->className(), "Sphere");
    EXPECT_EQ(described(*back), std::tuple(name, Sphere::kShapeWireSphere, 2.5f, 7));
    EXPECT_EQ(*back->color(), *ball->color()) << name;
  }
}

// Archives a stand-in that writes a primitive's keys with `color` as the
// colour's bytes (none when empty), and reads it back as a Sphere.
std::shared_ptr<Sphere> decodeWithColourBytes(const Bytes& color) {
  return testing::decodeFrom<Sphere>("Sphere", [color](KeyedArchiver& coder) {
    coder.encodeString("Ball", "layerName");
    coder.encodeInt32(Sphere::kShapeCube, "shape");
    coder.encodeFloat(2.0f, "size");
    coder.encodeInt32(6, "segments");
    if (!color.empty()) {
      coder.encodeBytes(color, "color");
    }
  });
}

TEST(SphereArchive, AMissingOrUnreadableColourReadsAsWhite) {
  const struct {
    std::string what;
    Bytes color;
  } cases[] = {
      {"no colour", {}},
      {"bytes that are no archive", {0x01, 0x02, 0x03}},
      {"an archive of something else",
       KeyedArchiver::archivedDataWithRootObject(std::make_shared<Layer>())},
  };
  for (const auto& c : cases) {
    CapturedLog log;
    const auto back = decodeWithColourBytes(c.color);
    ASSERT_TRUE(back) << c.what;
    EXPECT_EQ(*back->color(), Color(1, 1, 1, 1)) << c.what;
    // The rest of the primitive is read as usual.
    EXPECT_EQ(described(*back), std::tuple("Ball", Sphere::kShapeCube, 2.0f, 6)) << c.what;
  }
}

// --- drawing

class PrimitiveDrawingTest : public testing::PixelTest {
 protected:
  // Light 0 as its defaults leave it: white, from the viewer (+z). `setup`
  // runs before the layer draws, `after` after it.
  Frame renderLayer(
      Layer& layer, int width = 96, int height = 96, const std::function<void()>& setup = [] {},
      const std::function<void()>& after = [] {}) {
    return render(width, height, [&] {
      glEnable(GL_LIGHT0);
      setup();
      layer.drawGLWithOptions(options_);
      after();
    });
  }
  // The frame after the one that builds the display list.
  Frame renderSettled(
      Layer& layer, int width = 96, int height = 96, const std::function<void()>& setup = [] {},
      const std::function<void()>& after = [] {}) {
    renderLayer(layer, width, height, setup);
    return renderLayer(layer, width, height, setup, after);
  }

  RenderOptions options_;
};

// The shape is drawn through a list built in the first frame (which shows
// nothing) and rebuilt only when the size is set or the list invalidated;
// the colour is not in the list.
TEST_F(PrimitiveDrawingTest, TheListIsRebuiltOnlyForASizeOrAnInvalidationWhileColourShowsAtOnce) {
  const auto sphere = primitive(Sphere::kShapeCube, 40.0f, 64);
  sphere->setColor(Color::colorWithRGBA(1, 0, 0));
  EXPECT_EQ(renderLayer(*sphere).countDrawn(), 0) << "the frame that builds the list";
  EXPECT_EQ(renderLayer(*sphere).countDrawn(), 40 * 40);
  // A new shape keeps showing the cube: the list still holds it.
  sphere->setShape(Sphere::kShapeSphere);
  const Frame stale = renderLayer(*sphere);
  EXPECT_EQ(stale.countDrawn(), 40 * 40);
  EXPECT_EQ(stale.drawnBounds(), (Box{28, 28, 68, 68}));
  // Setting the size, even to the same value, rebuilds it.
  sphere->setSize(40.0f);
  EXPECT_EQ(renderLayer(*sphere).countDrawn(), 0);
  const Frame red = renderLayer(*sphere);
  const int round = red.countDrawn();
  EXPECT_NEAR(round, std::numbers::pi * 20 * 20, 0.02 * std::numbers::pi * 20 * 20);
  EXPECT_GT(red.at(48, 48).r, 200);
  EXPECT_LT(red.at(48, 48).b, 40);

  sphere->setColor(Color::colorWithRGBA(0, 0, 1));
  sphere->setSegments(4);
  const Frame blue = renderLayer(*sphere);
  EXPECT_LT(blue.at(48, 48).r, 40);
  EXPECT_GT(blue.at(48, 48).b, 200);
  EXPECT_EQ(blue.countDrawn(), round) << "still the 64-segment sphere";
  sphere->invalidateOpenGLDisplayLists();
  EXPECT_LT(renderSettled(*sphere).countDrawn(), 0.8 * round) << "a 4-segment sphere";
}

// Every shape seen with its y axis turned towards the viewer (a rotation
// of 90° about x), so the plane faces the viewer and the cone shows its
// side.
TEST_F(PrimitiveDrawingTest, EachShapeDrawsWhatItsNumberSays) {
  const double size = 40;
  const double r = size / 2;
  const double disc = std::numbers::pi * r * r;
  const struct {
    std::int32_t shape;
    std::int32_t segments;
    double minDrawn, maxDrawn;
    int width, height;  // of the drawn bounds; 0 for no check
    double nearZ;       // eye z of the surface seen at the centre
  } cases[] = {
      {0, 64, 0.98 * disc, 1.02 * disc, 40, 40, r},
      {1, 64, size * size, size * size, 40, 40, r},
      // Seen from above, the teapot spans 3.2 sizes from handle to spout.
      {2, 64, 1000, 128 * 50, 128, 0, 0.825 * size},
      {3, 64, 0.97 * r * size, 1.03 * r * size, 40, 40, r},
      {4, 64, size * size, size * size, 40, 40, 0},
      {5, 12, 100, 0.5 * disc, 40, 40, 0},
      {7, 64, 0.98 * disc, 1.02 * disc, 40, 40, r},
  };
  for (const auto& c : cases) {
    const auto sphere = primitive(c.shape, static_cast<float>(size), c.segments);
    const Frame frame = renderSettled(*sphere, 160, 96, [] { glRotated(90, 1, 0, 0); });
    EXPECT_GE(frame.countDrawn(), c.minDrawn) << "shape " << c.shape;
    EXPECT_LE(frame.countDrawn(), c.maxDrawn) << "shape " << c.shape;
    const auto bounds = frame.drawnBounds();
    ASSERT_TRUE(bounds) << "shape " << c.shape;
    EXPECT_NEAR(bounds->width(), c.width, 2) << "shape " << c.shape;
    if (c.height != 0) {
      EXPECT_NEAR(bounds->height(), c.height, 2) << "shape " << c.shape;
    }
    if (c.shape != Sphere::kShapeWireSphere) {
      EXPECT_NEAR(frame.depthAt(80, 48), 0.5 - c.nearZ / 2000, 0.002) << "shape " << c.shape;
      // Its normals face the viewer, and so the light.
      EXPECT_GT(frame.at(80, 48).r, 200) << "shape " << c.shape;
    }
  }
}

// Fog that is complete one unit from the eye: a fogged sphere, far from
// the eye, is blue.
void blueFogFarAway() {
  glTranslated(0, 0, -500);
  const GLfloat blue[] = {0.0f, 0.0f, 1.0f, 1.0f};
  glFogi(GL_FOG_MODE, GL_LINEAR);
  glFogf(GL_FOG_START, 0.0f);
  glFogf(GL_FOG_END, 1.0f);
  glFogfv(GL_FOG_COLOR, blue);
}

TEST_F(PrimitiveDrawingTest, FogAndLightingAreOnOnlyWhileTheShapeIsDrawn) {
  for (const bool fog : {false, true}) {
    const auto sphere = primitive(Sphere::kShapeSphere, 40.0f);
    sphere->setEnableFog(fog);
    bool stillOn = true;
    const Frame frame = renderSettled(*sphere, 96, 96, blueFogFarAway, [&] {
      stillOn = glIsEnabled(GL_FOG) || glIsEnabled(GL_LIGHTING);
    });
    const testing::Rgba blue{0, 0, 255, 255};
    EXPECT_EQ(testing::pixelIs(frame, 48, 48, blue, 2), fog) << "fog " << fog;
    EXPECT_GT(frame.at(48, 48).b, 200) << "fog " << fog;
    EXPECT_FALSE(stillOn) << "fog " << fog;
  }
}

TEST_F(PrimitiveDrawingTest, A3DPointIsASmallGreenBall) {
  Point3D point;
  EXPECT_EQ(point.name(), "3D Point");
  const Frame frame = render(64, 64, [&] {
    glScaled(100, 100, 100);  // radius 10 pixels
    point.drawGLWithOptions(options_);
  });
  EXPECT_TRUE(testing::pixelIs(frame, 32, 32, {0, 255, 0, 255}));
  // Ten slices make a decagon a little smaller than the disc.
  const double disc = std::numbers::pi * 10 * 10;
  EXPECT_GT(frame.count({0, 255, 0, 255}), 0.85 * disc);
  EXPECT_LT(frame.count({0, 255, 0, 255}), 1.02 * disc);
  EXPECT_EQ(frame.countDrawn(), frame.count({0, 255, 0, 255}));
}

TEST_F(PrimitiveDrawingTest, TheLightIsShownOnlyInTheEditor) {
  const struct {
    std::string what;
    std::optional<Value> editor;
    bool shown;
  } cases[] = {{"no editor option", std::nullopt, false},
               {"editor NO", Value(false), false},
               {"editor YES", Value(true), true}};
  LightSource light;
  for (const auto& c : cases) {
    RenderOptions options;
    if (c.editor) {
      options.setValueForKey(*c.editor, kRenderOptionEditor);
    }
    const Frame frame = render(64, 64, [&] {
      glColor3ub(255, 255, 255);
      glScaled(100, 100, 100);  // radius 20 pixels
      light.drawGLWithOptions(options);
    });
    EXPECT_EQ(frame.countDrawn() > 0, c.shown) << c.what;
    if (c.shown) {
      const auto bounds = frame.drawnBounds();
      ASSERT_TRUE(bounds);
      EXPECT_GE(bounds->width(), 36);
      EXPECT_LE(bounds->width(), 41);
    }
  }
}

// A light moved to (0, 10, 0) shines straight down on every object, wherever
// it stands: the top half of each sphere is lit, the bottom half is not, and
// left and right are alike. A point light at (0, 10, 0) would light the
// sphere above it from below and the others from the side; forgetting a
// drag in progress would light them from where the drag started.
TEST_F(PrimitiveDrawingTest, ALightAboveLightsEverySphereFromAboveWhereverItStands) {
  const struct {
    std::string what;
    std::array<double, 3> placed, dragged;
  } cases[] = {{"placed above", {0, 10, 0}, {0, 0, 0}},
               {"dragged above", {10, 0, 0}, {-10, 10, 0}}};
  // Sphere centres in the frame's units, and where they land in its pixels
  // (centre (80, 64), y down).
  const std::array<std::array<double, 2>, 3> places = {{{-45, 0}, {45, -25}, {0, 35}}};
  const int r = 15;
  for (const auto& c : cases) {
    LightSource light;
    light.objectToWorld()->setTranslation(c.placed);
    light.editingTransform()->setTranslation(c.dragged);
    const auto sphere = primitive(Sphere::kShapeSphere, 2 * r);
    const Frame frame = render(160, 128, [&] {
      glEnable(GL_LIGHTING);
      glEnable(GL_LIGHT0);
      light.setupLightSource();
      sphere->drawGLWithOptions(options_);  // builds the list
      for (const auto& p : places) {
        sphere->objectToWorld()->setTranslation({p[0], p[1], 0});
        sphere->drawContentWithOptions(options_);
      }
    });
    for (const auto& p : places) {
      const int cx = 80 + static_cast<int>(p[0]);
      const int cy = 64 - static_cast<int>(p[1]);
      const double top = frame.meanDrawnBrightness(Box{cx - r, cy - r, cx + r, cy});
      const double bottom = frame.meanDrawnBrightness(Box{cx - r, cy, cx + r, cy + r});
      const double left = frame.meanDrawnBrightness(Box{cx - r, cy - r, cx, cy + r});
      const double right = frame.meanDrawnBrightness(Box{cx, cy - r, cx + r, cy + r});
      EXPECT_GT(top, bottom + 60) << c.what << " at " << p[0] << ", " << p[1];
      EXPECT_NEAR(left, right, 4) << c.what << " at " << p[0] << ", " << p[1];
    }
  }
}

}  // namespace
}  // namespace cloudreel
