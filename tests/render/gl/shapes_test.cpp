#include "render/gl/shapes.h"

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <functional>
#include <numbers>
#include <string>

#include "support/pixel_harness.h"

namespace cloudreel::gl {
namespace {

using testing::Box;
using testing::Frame;
using testing::kRed;

using ShapesTest = testing::PixelTest;

void red() { glColor3ub(255, 0, 0); }

TEST_F(ShapesTest, AConeSeenFromTheSideIsATriangleWithItsApexAtTheHeight) {
  const double radius = 20;
  const double height = 40;
  const Frame frame = render(64, 64, [&] {
    red();
    glTranslated(0, -20, 0);
    glRotated(-90, 1, 0, 0);  // the cone's +z axis points up the frame
    drawSolidCone(radius, height, 64, 4);
  });
  EXPECT_NEAR(frame.count(kRed), radius * height, 0.03 * radius * height);
  // Base 20 units below the centre (frame row 52, y down), apex 40 above it.
  EXPECT_TRUE(testing::boundsNear(frame.drawnBounds(), {12, 12, 52, 52}, 1));
  // The width shrinks linearly towards the apex.
  for (int above : {5, 20, 35}) {
    const int row = 52 - above;
    const int width = frame.count(kRed, 0, Box{0, row, 64, row + 1});
    EXPECT_NEAR(width, 2 * radius * (1 - (above - 0.5) / height), 2) << above << " rows up";
  }
}

TEST_F(ShapesTest, TheTeapotStandsUpWithItsSpoutToTheRight) {
  const double size = 20;
  const Frame frame = render(96, 64, [&] {
    red();
    drawSolidTeapot(size);
  });
  // Handle at x = -1.5 size, spout tip at 1.65 size, bottom at y = -0.75
  // size, knob at 0.825 size; the frame's centre is (48, 32), y down.
  EXPECT_TRUE(testing::boundsNear(
      frame.drawnBounds(), {48 - 1.5 * size, 32 - 0.825 * size, 48 + 1.65 * size, 32 + 0.75 * size},
      1.5));
  EXPECT_TRUE(testing::pixelIs(frame, 48, 32, kRed));
}

// Light from one side: the half of the shape that faces it is brighter.
// Inward normals or clockwise faces would light the wrong half or cull the
// visible one.
TEST_F(ShapesTest, LitShapesAreBrighterOnTheSideFacingTheLight) {
  struct Shape {
    std::string name;
    std::function<void()> draw;
  };
  const Shape shapes[] = {
      {"sphere", [] { drawSolidSphere(24, 32, 16); }},
      {"cube",
       [] {
         glRotated(45, 0, 1, 0);
         drawSolidCube(30);
       }},
      {"cone",
       [] {
         glRotated(-90, 1, 0, 0);
         drawSolidCone(20, 40, 32, 4);
       }},
      {"teapot", [] { drawSolidTeapot(16); }},
  };
  for (const Shape& shape : shapes) {
    for (float side : {1.0f, -1.0f}) {
      const Frame frame = render(64, 64, [&] {
        glEnable(GL_LIGHTING);
        glEnable(GL_LIGHT0);
        glEnable(GL_CULL_FACE);
        glEnable(GL_NORMALIZE);
        const GLfloat direction[] = {side, 0.0f, 0.0f, 0.0f};
        const GLfloat none[] = {0.0f, 0.0f, 0.0f, 1.0f};
        const GLfloat white[] = {1.0f, 1.0f, 1.0f, 1.0f};
        glLightfv(GL_LIGHT0, GL_POSITION, direction);
        glLightfv(GL_LIGHT0, GL_DIFFUSE, white);
        glLightfv(GL_LIGHT0, GL_AMBIENT, none);
        glLightModelfv(GL_LIGHT_MODEL_AMBIENT, none);
        // A little emission keeps the dark side drawn, so both halves count.
        const GLfloat glow[] = {0.05f, 0.05f, 0.05f, 1.0f};
        glMaterialfv(GL_FRONT, GL_EMISSION, glow);
        glMaterialfv(GL_FRONT, GL_AMBIENT_AND_DIFFUSE, white);
        shape.draw();
      });
      const double left = frame.meanDrawnBrightness(Box{0, 0, 32, 64});
      const double right = frame.meanDrawnBrightness(Box{32, 0, 64, 64});
      EXPECT_GT(frame.countDrawn(), 300) << shape.name;
      if (side > 0) {
        EXPECT_GT(right, left + 20) << shape.name << " lit from the right";
      } else {
        EXPECT_GT(left, right + 20) << shape.name << " lit from the left";
      }
    }
  }
}

// With back faces culled, what shows at the centre is the surface nearest
// the viewer: its triangles run counter-clockwise seen from outside. The
// projection maps eye z to depth 0.5 - z / 2000.
TEST_F(ShapesTest, SolidsShowTheirNearSideWhenBackFacesAreCulled) {
  struct Shape {
    std::string name;
    std::function<void()> draw;
    double nearZ;  // eye z of the nearest surface at the centre
  };
  const Shape shapes[] = {
      {"sphere", [] { drawSolidSphere(20, 32, 16); }, 20},
      {"cube", [] { drawSolidCube(30); }, 15},
      {"cone", [] { drawSolidCone(20, 20, 32, 4); }, 20},  // apex towards the viewer
      {"cone base",
       [] {
         glRotated(180, 1, 0, 0);
         drawSolidCone(20, 20, 32, 4);
       },
       0},
      {"teapot", [] { drawSolidTeapot(20); }, 20},
  };
  for (const Shape& shape : shapes) {
    const Frame frame = render(64, 64, [&] {
      glEnable(GL_CULL_FACE);
      glCullFace(GL_BACK);
      red();
      shape.draw();
    });
    EXPECT_TRUE(testing::pixelIs(frame, 32, 32, kRed)) << shape.name;
    EXPECT_NEAR(frame.depthAt(32, 32), 0.5 - shape.nearZ / 2000, 0.002) << shape.name;
  }
}

TEST_F(ShapesTest, DegenerateRequestsDrawNothing) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  const double inf = std::numeric_limits<double>::infinity();
  const std::pair<std::string, std::function<void()>> cases[] = {
      {"sphere radius 0", [] { drawSolidSphere(0, 16, 8); }},
      {"sphere radius -1", [] { drawSolidSphere(-1, 16, 8); }},
      {"sphere radius NaN", [&] { drawSolidSphere(nan, 16, 8); }},
      {"sphere 2 slices", [] { drawSolidSphere(10, 2, 8); }},
      {"sphere 1 stack", [] { drawSolidSphere(10, 16, 1); }},
      {"wire sphere negative slices", [] { drawWireSphere(10, -4, 8); }},
      {"cube edge 0", [] { drawSolidCube(0); }},
      {"cube edge -1", [] { drawSolidCube(-1); }},
      {"cube edge infinite", [&] { drawSolidCube(inf); }},
      {"cone height 0", [] { drawSolidCone(10, 0, 16, 2); }},
      {"cone 0 stacks", [] { drawSolidCone(10, 10, 16, 0); }},
      {"cone -7 slices and stacks", [] { drawSolidCone(10, 10, -7, -7); }},
      {"teapot size -2", [] { drawSolidTeapot(-2); }},
      {"teapot size NaN", [&] { drawSolidTeapot(nan); }},
  };
  for (const auto& [name, draw] : cases) {
    const Frame frame = render(32, 32, [&] {
      red();
      draw();
    });
    EXPECT_EQ(frame.countDrawn(), 0) << name;
  }
}

TEST_F(ShapesTest, HugeSubdivisionsAreClampedAndStillDraw) {
  const int huge = std::numeric_limits<int>::max();
  const std::pair<std::string, std::function<void()>> cases[] = {
      {"cone", [&] { drawSolidCone(10, 10, huge, 1); }},
      {"sphere", [&] { drawSolidSphere(10, huge, huge); }},
  };
  for (const auto& [name, draw] : cases) {
    const Frame frame = render(32, 32, [&] {
      red();
      draw();
    });
    EXPECT_NEAR(frame.count(kRed), std::numbers::pi * 100, 0.03 * std::numbers::pi * 100) << name;
  }
}

}  // namespace
}  // namespace cloudreel::gl
