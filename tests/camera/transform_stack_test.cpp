// Transform stacks: how members combine their paths' poses, their order,
// and their archive.
#include "camera/transform_stack.h"

#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "camera/camera.h"
#include "camera/discrete_camera_path.h"
#include "scene/archive_helpers.h"
#include "support/near.h"

namespace cloudreel {
namespace {

using Point = std::array<double, 3>;
using testing::applied;
using testing::expectNear;

// A path of `frames` frames, each turned by the type-11 Euler angles and
// standing at `position`.
std::shared_ptr<DiscreteCameraPath> posedPath(int frames, const std::array<double, 3>& euler,
                                              const Point& position) {
  CameraPathRecord record;
  record.position = position;
  record.matrix = AffineTransform::initWithEulerType(euler, 11)->mx();
  auto path = std::make_shared<DiscreteCameraPath>(25);
  path->setPoints(std::vector<CameraPathRecord>(static_cast<std::size_t>(frames), record));
  return path;
}

TEST(TransformStack, MembersApplyInListOrderEachKeepingWhatItsSwitchesSay) {
  // Member 1 turns x to y (about z) and moves by (1, 0, 0); member 2 turns
  // y to z (about x) and moves by (0, 2, 0).
  const auto first = posedPath(1, {90, 0, 0}, {1, 0, 0});
  const auto second = posedPath(1, {0, 90, 0}, {0, 2, 0});
  const struct {
    std::string what;
    std::function<void(TransformStackMember&)> adjust;  // of member 1
    Point x;                                            // where the stack sends (1, 0, 0)
  } cases[] = {
      // M2 · M1: x → y + (1, 0, 0) → (1, 0, 1) + (0, 2, 0).
      {"as made", [](TransformStackMember&) {}, {1, 2, 1}},
      // invertRotation is stored but changes nothing.
      {"rotation inverted", [](TransformStackMember& m) { m.setInvertRotation(true); }, {1, 2, 1}},
      {"gain 0 keeps the turn, drops the move",
       [](TransformStackMember& m) { m.setTranslationGain(0); },
       {0, 2, 1}},
      {"translation inverted and doubled",
       [](TransformStackMember& m) {
         m.setInvertTranslation(true);
         m.setTranslationGain(2);
       },
       {-2, 2, 1}},
      {"both off is the identity",
       [](TransformStackMember& m) {
         m.setEnableRotation(false);
         m.setEnableTranslation(false);
       },
       {1, 2, 0}},
  };
  for (const auto& c : cases) {
    TransformStack stack;
    stack.addTransformation(TransformStackMember::initWithCameraPath(first));
    stack.addTransformation(TransformStackMember::initWithCameraPath(second));
    c.adjust(*stack.transformations()[0]);
    const auto camera = stack.cameraInObjectSpaceForFrame(0);
    ASSERT_NE(camera, nullptr);
    expectNear(applied(*camera->inertialToObject(), {1, 0, 0}), c.x, 1e-9, c.what);
  }
}

TEST(TransformStack, RunsAsLongAsItsLongestPathAndShorterOnesFallSilent) {
  TransformStack stack;
  EXPECT_EQ(stack.nFrames(), 0);
  EXPECT_EQ(stack.cameraInObjectSpaceForFrame(0)->inertialToObject()->mx(),
            AffineTransform::kIdentity);
  stack.addTransformation(TransformStackMember::initWithCameraPath(posedPath(3, {}, {1, 0, 0})));
  stack.addTransformation(TransformStackMember::initWithCameraPath(posedPath(7, {}, {0, 1, 0})));
  stack.addTransformation(TransformStackMember::initWithCameraPath(posedPath(5, {}, {0, 0, 1})));
  EXPECT_EQ(stack.nFrames(), 7);
  // Frame 4 is past the first path's end: it contributes nothing there. Time
  // 1 asks for frame 7, past every path.
  expectNear(applied(*stack.cameraInObjectSpaceForFrame(4)->inertialToObject(), {0, 0, 0}),
             {0, 1, 1}, 1e-9, "frame 4");
  expectNear(applied(*stack.cameraInObjectSpaceForTime(1.0f)->inertialToObject(), {0, 0, 0}),
             {0, 0, 0}, 1e-9, "time 1");
  // A stack that reaches itself through a member counts as empty there.
  auto looped = std::make_shared<TransformStack>();
  looped->addTransformation(TransformStackMember::initWithCameraPath(looped));
  EXPECT_EQ(looped->nFrames(), 0);
  EXPECT_NE(looped->cameraInObjectSpaceForFrame(0), nullptr);
  looped->setTransformations({});  // break the ownership cycle
}

TEST(TransformStack, MovingAMemberSwapsNeighboursAndOnlyThenAnnouncesIt) {
  const struct {
    bool up;
    int index;
    std::string order;
  } cases[] = {{true, 1, "BAC"}, {true, 2, "ACB"},  {false, 0, "BAC"}, {false, 1, "ACB"},
               {true, 0, "ABC"}, {false, 2, "ABC"}, {true, 3, "ABC"},  {false, -1, "ABC"}};
  for (const auto& c : cases) {
    TransformStack stack;
    for (const char* name : {"A", "B", "C"}) {
      auto path = posedPath(1, {}, {});
      path->setName(name);
      stack.addTransformation(TransformStackMember::initWithCameraPath(path));
    }
    int announced = 0;
    CallbackObserver observer([&](const auto&...) { ++announced; });
    stack.addObserver(observer, "transformations", ObservingOptions::None, "");
    c.up ? stack.moveItemUp(c.index) : stack.moveItemDown(c.index);
    std::string order;
    for (const auto& member : stack.transformations()) {
      order += member->name();
    }
    EXPECT_EQ(order, c.order) << (c.up ? "up " : "down ") << c.index;
    EXPECT_EQ(announced, c.order == "ABC" ? 0 : 1) << (c.up ? "up " : "down ") << c.index;
    stack.removeObserver(observer, "transformations");
  }
}

TEST(TransformStack, MembersComeBackFromTheArchiveWithoutTheirNames) {
  auto stack = std::make_shared<TransformStack>();
  auto member = TransformStackMember::initWithCameraPath(posedPath(4, {}, {1, 2, 3}));
  member->setTranslationGain(0.5f);
  member->setInvertRotation(true);
  member->setEnableRotation(false);
  stack->addTransformation(member);
  const auto decoded = testing::roundTrip(stack);
  ASSERT_NE(decoded, nullptr);
  EXPECT_EQ(decoded->name(), "New stack");
  ASSERT_EQ(decoded->transformations().size(), 1u);
  const auto& back = *decoded->transformations()[0];
  EXPECT_EQ(back.name(), "");
  EXPECT_EQ(back.path()->className(), "DiscreteCameraPath");
  EXPECT_EQ(decoded->nFrames(), 4);
  EXPECT_EQ(std::vector<bool>({back.invertRotation(), back.invertTranslation(),
                               back.enableRotation(), back.enableTranslation()}),
            std::vector<bool>({true, false, false, true}));
  expectNear(applied(*decoded->cameraInObjectSpaceForFrame(0)->inertialToObject(), {0, 0, 0}),
             {0.5, 1, 1.5}, 1e-9, "decoded");
  // An older member without the values reads them as NO and 0.
  const auto bare =
      testing::decodeFrom<TransformStackMember>("TransformStackMember", [](KeyedArchiver&) {});
  ASSERT_NE(bare, nullptr);
  EXPECT_EQ(bare->path(), nullptr);
  EXPECT_EQ(bare->translationGain(), 0.0f);
  EXPECT_FALSE(bare->enableRotation() || bare->enableTranslation());
}

}  // namespace
}  // namespace cloudreel
