#include "geometry/rotations.h"

#include <gtest/gtest.h>

#include <cmath>

#include "geometry/trackball.h"
#include "support/near.h"

namespace cloudreel {
namespace {

using testing::expectNear;
const double kHalf = std::sqrt(0.5);

TEST(Rotations, SlerpTakesTheShorterArcAndBlendsLinearlyWhenClose) {
  Quaternion out;
  slerpQuaternion({1, 0, 0, 0}, {0, 0, 0, 1}, out, 0.5);
  expectNear(out, {kHalf, 0, 0, kHalf});
  // The FROM quaternion is flipped, then the two coincide: linear branch.
  for (double t : {0.0, 0.3, 1.0, 2.0}) {
    slerpQuaternion({1, 0, 0, 0}, {-1, 0, 0, 0}, out, t);
    expectNear(out, {-1, 0, 0, 0});
  }
  // t is not clamped: 2.0 goes on past the end (180° about z).
  slerpQuaternion({1, 0, 0, 0}, {kHalf, 0, 0, kHalf}, out, 2.0);
  expectNear(out, {0, 0, 0, 1});
}

TEST(Rotations, ConversionsAndTheirSpecialCases) {
  EulerAngles e;
  quaternionToEuler({1, 0, 0, 0}, e);
  expectNear(e, {0, 0, 0});
  quaternionToEuler({0.7071, 0, 0, 0.7071}, e);  // singular branch
  EXPECT_EQ(e[1], 90.0);
  EXPECT_EQ(e[0], 0.0);
  quaternionToEuler({0.7071, 0, 0, -0.7071}, e);
  EXPECT_EQ(e[1], -90.0);

  AxisAngle aa;
  quaternionToAxisAngle({1, 0, 0, 0}, aa);
  expectNear(aa, {0, 1, 0, 0});
  Quaternion q;
  axisAngleToQuaternion(q, {90, 0, 0, 1});
  expectNear(q, {kHalf, 0, 0, kHalf});
  quaternionToAxisAngle(q, aa);
  expectNear(aa, {90, 0, 0, 1});

  // Euler to quaternion and back through a matrix is self-consistent: the
  // matrix of an Euler-made quaternion is orthonormal with determinant 1.
  eulerToQuaternion(q, 10, 20, 30);
  Matrix16 m;
  quaternionToMatrix(q, m);
  AffineTransform t(m);
  EXPECT_NEAR(t.determinant(), 1.0f, 1e-6);
  // quaternionToMatrix is the transpose of setQuaternionRotation's block
  // (apart from that block's element 2).
  AffineTransform block;
  block.setQuaternionRotation(q);
  EXPECT_DOUBLE_EQ(m[1], block.mx()[4]);
  EXPECT_DOUBLE_EQ(m[6], block.mx()[9]);
}

TEST(Trackball, DragsTurnFromTheStart) {
  // A 200×100 view: radius 50, centre (100, 50).
  trackballBegin(100, 50, 0, 0, 200, 100);
  EXPECT_EQ(trackballDragState().radius, 50.0f);
  EXPECT_EQ(trackballDragState().start[2], 50.0f);

  AxisAngle roll = {7, 7, 7, 7};
  trackballRoll(100, 50, roll);  // no movement: untouched
  EXPECT_EQ(roll, (AxisAngle{7, 7, 7, 7}));

  trackballRoll(150, 50, roll);  // centre to rim: 90° about y
  expectNear(roll, {90, 0, 1, 0}, 1e-5);
  trackballRoll(125, 50, roll);  // measured from the start again, not the last roll
  EXPECT_NEAR(roll[0], 30.0, 1e-4);
  // Adding turns together is checked through the camera trackball.
}

}  // namespace
}  // namespace cloudreel
