// Splines: evaluation, editing, hit tests, copies and the archive; and the
// editor's mouse logic driving them.
#include "timeline/spline.h"

#include <gtest/gtest.h>

#include <cmath>
#include <initializer_list>
#include <limits>
#include <vector>

#include "scene/archive_helpers.h"
#include "timeline/spline_editor_controller.h"

namespace cloudreel {
namespace {

std::shared_ptr<Spline> splineThrough(std::initializer_list<Point2D> knots) {
  std::vector<std::shared_ptr<SplinePoint>> points;
  for (const Point2D& k : knots) points.push_back(SplinePoint::pointWithPoint(k));
  auto spline = std::make_shared<Spline>();
  spline->setPoints(points);
  return spline;
}

std::vector<double> knotXs(const Spline& spline) {
  std::vector<double> xs;
  for (const auto& p : spline.points()) xs.push_back(p->point().x);
  return xs;
}

TEST(Spline, EvaluatesHandleSlopesAsTangentsOfEachSegmentsOwnParameter) {
  const Spline identity;
  const auto peak = splineThrough({{0, 0}, {0.5, 1}, {1, 1}});
  const struct {
    const Spline& spline;
    float x;
    float expected;
  } cases[] = {
      {identity, 0.0f, 0.0f},
      {identity, 1.0f, 1.0f},
      {identity, 0.5f, 0.5f},
      {identity, 1.0001f, 0.0f},  // outside 0..1 is 0, not the end value
      {identity, -0.001f, 0.0f},
      {identity, std::numeric_limits<float>::quiet_NaN(), 0.0f},
      {*peak, 0.5f, 1.0f},  // an inner knot takes the end of the left segment
      {*peak, 0.25f, 0.5f},
      // s = 0.25 with unit slopes; slopes scaled by the width 0.5 would give 0.203125.
      {*peak, 0.125f, 0.25f},
  };
  for (const auto& c : cases) {
    EXPECT_EQ(c.spline.valueForTime(c.x), c.expected) << "at " << c.x;
  }
  EXPECT_EQ(Spline::interpolateSegmentForTime(0.5f, 0.0f, 1.0f, 1.0f, 1.0f), 0.5f);
}

TEST(Spline, EvaluatesSafelyWhenThePointsNoLongerCoverTheInput) {
  EXPECT_EQ(splineThrough({})->valueForTime(0.5f), 0.0f);
  EXPECT_EQ(splineThrough({{0.3, 0.7}})->valueForTime(0.1f), 0.7f);
  // The end point deleted: past the last knot the curve holds its value.
  auto cut = splineThrough({{0, 0}, {0.5, 1}, {1, 1}});
  cut->movePointWithIndex(2, {1.5, 1});
  cut->validatePointAtIndex(2);
  ASSERT_EQ(cut->points().size(), 2u);
  EXPECT_EQ(cut->valueForTime(0.75f), 1.0f);
  // A zero-width segment and a vertical handle give NaN and infinity, no trap.
  EXPECT_TRUE(std::isnan(splineThrough({{0, 0}, {0, 1}, {1, 1}})->valueForTime(0.0f)));
  Spline vertical;
  vertical.moveRightTangentWithIndex(0, {0, 1});
  EXPECT_TRUE(std::isinf(vertical.valueForTime(0.5f)));
}

TEST(Spline, InsertsAndMovesPointsKeepingTheirOrderOneExchangeAtATime) {
  Spline spline;
  EXPECT_EQ(spline.insertPoint({0.5, 0.5}), 1);
  const auto inserted = spline.points()[1];
  EXPECT_EQ(inserted->leftTangent(), (Point2D{0.5 - 0.1, 0.5 - 0.1}));
  EXPECT_EQ(inserted->rightTangent(), (Point2D{0.5 + 0.1, 0.5 + 0.1}));
  EXPECT_EQ(spline.insertPoint({0.5, 0.2}), 1);  // an equal x goes before
  EXPECT_EQ(spline.points()[2], inserted);
  EXPECT_EQ(splineThrough({{0, 0}, {0.5, 0.5}})->insertPoint({0.9, 0}), 2);  // appended

  // Knots 0, 0.3, 0.6, 1: knot 1 dragged past both right neighbours moves one place.
  auto s = splineThrough({{0, 0}, {0.3, 0.3}, {0.6, 0.6}, {1, 1}});
  const auto dragged = s->points()[1];
  EXPECT_EQ(s->movePointWithIndex(1, {1.5, 0.5}), 2);
  EXPECT_EQ(knotXs(*s), (std::vector<double>{0, 0.6, 1.5, 1}));
  // The handles move along by the knot's offset.
  EXPECT_EQ(dragged->leftTangent(),
            (Point2D{(0.3 - 0.1) + (1.5 - 0.3), (0.3 - 0.1) + (0.5 - 0.3)}));
  EXPECT_EQ(dragged->rightTangent(),
            (Point2D{(0.3 + 0.1) + (1.5 - 0.3), (0.3 + 0.1) + (0.5 - 0.3)}));
  EXPECT_EQ(s->movePointWithIndex(2, {1.5, 0.5}), 3);
  EXPECT_EQ(s->movePointWithIndex(3, {0.1, 0.5}), 2);  // the left neighbour first
  EXPECT_EQ(s->points()[2], dragged);

  // Handles never cross their knot.
  SplinePoint point(Point2D{0.5, 0.5});
  point.setLeftTangentToPoint({0.9, 0.2});
  point.setRightTangentToPoint({0.1, 0.8});
  EXPECT_EQ(point.leftTangent(), (Point2D{0.5, 0.2}));
  EXPECT_EQ(point.rightTangent(), (Point2D{0.5, 0.8}));

  // Knots outside 0..1 are removed, those on its ends kept; indexes outside
  // the list change nothing.
  auto edges = splineThrough({{-0.01, 0}, {0, 0}, {1, 1}, {1.01, 1}});
  edges->validatePointAtIndex(3);
  edges->validatePointAtIndex(2);
  edges->validatePointAtIndex(1);
  edges->validatePointAtIndex(0);
  EXPECT_EQ(knotXs(*edges), (std::vector<double>{0, 1}));
  for (std::int32_t bad : {-1, 2, INT32_MAX}) {
    EXPECT_EQ(edges->movePointWithIndex(bad, {0.5, 0.5}), bad);
    EXPECT_EQ(edges->moveLeftTangentWithIndex(bad, {0.5, 0.5}), bad);
    EXPECT_EQ(edges->moveRightTangentWithIndex(bad, {0.5, 0.5}), bad);
    edges->validatePointAtIndex(bad);
  }
  EXPECT_EQ(knotXs(*edges), (std::vector<double>{0, 1}));
  EXPECT_EQ(edges->points()[0]->rightTangent(), (Point2D{0.1, 0.1}));
}

TEST(Spline, HitTestsAnswerTheFirstKnotOrHandleWithinTheRadius) {
  const auto s = splineThrough({{0, 0}, {0.05, 0}, {1, 1}});
  EXPECT_EQ(s->indexOfPointWithin(0.625f, {0.375, 0.5}), 0);  // exactly r counts
  EXPECT_EQ(s->indexOfPointWithin(0.62f, {0.375, 0.5}), 1);
  EXPECT_EQ(s->indexOfPointWithin(0.1f, {0.05, 0}), 0);  // list order, not nearest
  EXPECT_EQ(s->indexOfPointWithin(0.01f, {0.5, 0.5}), -1);
  EXPECT_EQ(s->indexOfLeftTangentWithin(1e-6f, {0.9, 0.9}), 2);
  EXPECT_EQ(s->indexOfRightTangentWithin(1e-6f, {0.15, 0.1}), 1);
  EXPECT_EQ(s->indexOfRightTangentWithin(0.01f, {0.9, 0.9}), -1);
}

TEST(Spline, CopiesShareTheirPointsAndArchivesRoundTrip) {
  Spline original;
  const auto copy = original.copy();
  copy->movePointWithIndex(1, {1, 0.25});
  EXPECT_EQ(original.points()[1]->point(), (Point2D{1, 0.25}));  // the same point objects
  copy->insertPoint({0.5, 0.5});
  EXPECT_EQ(original.points().size(), 2u);  // but lists of their own
  const auto point = original.points()[1]->copy();
  EXPECT_NE(point, original.points()[1]);
  EXPECT_EQ(point->rightTangent(), original.points()[1]->rightTangent());

  auto spline = splineThrough({{0, 0}, {0.1, 1.0 / 3}, {1, 1}});
  spline->moveLeftTangentWithIndex(1, {-1e-300, 0.7});
  const auto back = testing::roundTrip(spline);
  ASSERT_TRUE(back);
  ASSERT_EQ(back->points().size(), 3u);
  for (std::size_t i = 0; i < 3; ++i) {
    EXPECT_EQ(back->points()[i]->point(), spline->points()[i]->point());
    EXPECT_EQ(back->points()[i]->leftTangent(), spline->points()[i]->leftTangent());
    EXPECT_EQ(back->points()[i]->rightTangent(), spline->points()[i]->rightTangent());
  }
  // Null entries are dropped; a missing list is no points.
  const auto damaged = testing::decodeFrom<Spline>("Spline", [](KeyedArchiver& a) {
    a.encodeList(std::vector<ObjectPtr>{nullptr, SplinePoint::pointWithPoint({0.5, 0.5})},
                 "points");
  });
  ASSERT_TRUE(damaged);
  EXPECT_EQ(knotXs(*damaged), std::vector<double>{0.5});
  const auto empty = testing::decodeFrom<Spline>("Spline", [](KeyedArchiver&) {});
  ASSERT_TRUE(empty);
  EXPECT_TRUE(empty->points().empty());
}

TEST(SplineEditorController, GrabsInsertsDragsAndDeletesAsTheMouseSays) {
  const Rect2D bounds{0, 0, 200, 100};  // hit radius 5 / 200 = 0.025
  SplineEditorController editor;
  int redraws = 0;
  editor.setRedraw([&] { ++redraws; });

  // No spline: nothing happens.
  editor.mouseDown({0, 0}, bounds, false);
  editor.mouseUp();
  EXPECT_EQ(redraws, 0);

  auto spline = std::make_shared<Spline>();
  editor.setTheSpline(spline);
  // Knot 0 with its right handle 2 px away.
  spline->moveRightTangentWithIndex(0, {0.01, 0});
  editor.mouseDown({1, 0}, bounds, false);
  EXPECT_TRUE(editor.isDraggingPoint());
  EXPECT_EQ(editor.indexOfDragPoint(), 0);
  editor.mouseUp();
  editor.mouseDown({1, 0}, bounds, true);
  EXPECT_FALSE(editor.isDraggingPoint());
  EXPECT_TRUE(editor.isDraggingRightTangent());
  editor.mouseDragged({40, 60}, bounds);
  EXPECT_EQ(spline->points()[0]->rightTangent(), (Point2D{0.2, 0.6}));
  editor.mouseUp();
  EXPECT_FALSE(editor.isDraggingRightTangent());
  EXPECT_EQ(spline->points().size(), 2u);      // its knot is inside 0..1
  editor.mouseDown({200, 100}, bounds, true);  // no handle there: the knot
  EXPECT_TRUE(editor.isDraggingPoint());
  EXPECT_EQ(editor.indexOfDragPoint(), 1);
  editor.mouseUp();

  // A miss inserts a knot; dragged past its right neighbour it changes
  // place, and released outside 0..1 it is deleted.
  editor.mouseDown({100, 25}, bounds, false);
  EXPECT_EQ(knotXs(*spline), (std::vector<double>{0, 0.5, 1}));
  EXPECT_TRUE(editor.isDraggingPoint());
  EXPECT_EQ(editor.indexOfDragPoint(), 1);
  editor.mouseDragged({220, 25}, bounds);
  EXPECT_EQ(editor.indexOfDragPoint(), 2);
  EXPECT_EQ(knotXs(*spline), (std::vector<double>{0, 1, 1.1}));
  editor.mouseUp();
  EXPECT_EQ(knotXs(*spline), (std::vector<double>{0, 1}));
  EXPECT_FALSE(editor.isDraggingPoint());
  EXPECT_EQ(redraws, 11);  // the set, then every one of the ten events

  // Bounds without area ignore the event; a new spline ends the drag.
  editor.mouseDown({100, 25}, Rect2D{0, 0, 0, 100}, false);
  editor.mouseDown({100, 25}, Rect2D{0, 0, 200, 0}, false);
  EXPECT_EQ(spline->points().size(), 2u);
  EXPECT_EQ(redraws, 11);
  editor.mouseDown({100, 25}, bounds, false);
  editor.setTheSpline(std::make_shared<Spline>());
  EXPECT_FALSE(editor.isDraggingPoint());
}

}  // namespace
}  // namespace cloudreel
