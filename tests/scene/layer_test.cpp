#include "scene/layer.h"

#include <gtest/gtest.h>

#include <limits>
#include <tuple>

#include "scene/archive_helpers.h"
#include "scene/light_source.h"

namespace cloudreel {
namespace {

using testing::decodeFrom;
using testing::roundTrip;

// An animated layer's settings in one comparable value: name, isVisible,
// isInWorld, animate, animationPath, billboardDistance, enableFog, nFrames,
// FPS.
auto settingsOf(const AnimatedLayer& l) {
  return std::tuple(l.name(), l.isVisible(), l.isInWorld(), l.animate(), l.animationPath(),
                    l.billboardDistance(), l.enableFog(), l.nFrames(), l.FPS());
}

TEST(Layer, BillboardDistanceIsNeverNegative) {
  const struct {
    float set, stored;
  } cases[] = {
      {-2.0f, 0.0f}, {3.5f, 3.5f}, {0.0f, 0.0f}, {std::numeric_limits<float>::quiet_NaN(), 0.0f}};
  for (const auto& c : cases) {
    Layer layer;
    layer.setBillboardDistance(c.set);
    EXPECT_EQ(layer.billboardDistance(), c.stored) << c.set;
    // The same through key-value coding, as the property panel sets it.
    layer.setValueForKey(static_cast<double>(c.set), "billboardDistance");
    EXPECT_EQ(layer.billboardDistance(), c.stored) << c.set;
  }
}

TEST(Layer, CopyKeepsTheClassAppendsToTheNameSharesChildrenAndLeavesEditingStateBehind) {
  auto child = std::make_shared<Layer>();
  Layer cloud;
  cloud.setName("Cloud");
  cloud.addChildLayer(child);
  cloud.setIsModified(true);
  cloud.setIsEditing(true);
  cloud.setBillboardDistance(4.0f);
  cloud.setBoundingBoxWithMinXMaxXMinYMaxYMinZMaxZ(1, 2, 3, 4, 5, 6);
  cloud.editingTransform()->setTranslation({1, 2, 3});
  cloud.objectToWorld()->setTranslation({4, 5, 6});

  const auto copy = copyOf(cloud);
  EXPECT_EQ(copy->name(), "Cloud copy");
  ASSERT_EQ(copy->childLayerCount(), 1);
  EXPECT_EQ(copy->childLayers()[0], child);
  EXPECT_FALSE(copy->isModified());
  EXPECT_FALSE(copy->isEditing());
  EXPECT_EQ(copy->billboardDistance(), 4.0f);
  EXPECT_EQ(copy->bbox(), cloud.bbox());
  EXPECT_EQ(copy->editingTransform()->mx(), AffineTransform::kIdentity);
  EXPECT_EQ(copy->objectToWorld()->mx(), cloud.objectToWorld()->mx());
  EXPECT_NE(copy->objectToWorld(), cloud.objectToWorld());

  // Adding to the copy's list leaves the original's alone.
  copy->addChildLayer(std::make_shared<Layer>());
  EXPECT_EQ(cloud.childLayerCount(), 1);

  // Copies are of the original's class.
  AnimatedLayer animated;
  animated.setFPS(12);
  animated.setNFrames(48);
  const auto animatedCopy = copyOf(animated);
  EXPECT_EQ(animatedCopy->className(), "AnimatedLayer");
  EXPECT_EQ(animatedCopy->FPS(), 12);
  EXPECT_EQ(animatedCopy->nFrames(), 48);
  EXPECT_EQ(copyOf(LightSource())->className(), "LightSource");
}

TEST(LayerArchive, WritesTheBoxInItsOwnOrder) {
  auto layer = std::make_shared<Layer>();
  layer->setBoundingBoxWithMinXMaxXMinYMaxYMinZMaxZ(1, 2, 3, 4, 5, 6);
  EXPECT_EQ(layer->bbox(), (Layer::BoundingBox{1, 3, 5, 2, 4, 6}));

  // Read the written keys back through a class that records them.
  struct Probe : Object {
    std::string_view className() const override { return "Layer"; }
    void initWithCoder(KeyedUnarchiver& coder) override {
      for (std::size_t i = 0; i < 6; ++i) {
        box[i] = coder.decodeDoubleForKey("bbox0" + std::to_string(i));
      }
      keys = coder.allKeys();
    }
    Layer::BoundingBox box{};
    std::vector<std::string> keys;
  };
  ClassRegistry registry;
  registerCoreClasses(registry);
  registry.registerClass<Probe>("Layer");
  Error error;
  const auto probe = std::dynamic_pointer_cast<Probe>(KeyedUnarchiver::unarchiveObjectWithData(
      KeyedArchiver::archivedDataWithRootObject(layer), &error, registry));
  ASSERT_TRUE(probe) << error.message;
  EXPECT_EQ(probe->box, (Layer::BoundingBox{1, 3, 5, 2, 4, 6}));
  EXPECT_EQ(probe->keys,
            (std::vector<std::string>{"animate", "animationPath", "bbox00", "bbox01", "bbox02",
                                      "bbox03", "bbox04", "bbox05", "billboardDistance",
                                      "childLayers", "enableFog", "inertialToObject", "isInWorld",
                                      "isVisible", "layerName", "objectToWorld"}));
}

TEST(LayerArchive, RoundTripsTheTreeAndItsSettings) {
  auto root = std::make_shared<AnimatedLayer>();
  root->setName("Root");
  root->setIsVisible(false);
  root->setIsInWorld(false);
  root->setAnimate(true);
  root->setAnimationPath(3);
  root->setBillboardDistance(2.5f);
  root->setEnableFog(true);
  root->setNFrames(90);
  root->setFPS(30);
  root->setBoundingBoxWithMinXMaxXMinYMaxYMinZMaxZ(-1, 1, -2, 2, -3, 3);
  root->objectToWorld()->setTranslation({1, 2, 3});
  root->inertialToObject()->setToScale(2);
  root->editingTransform()->setTranslation({9, 9, 9});  // pending edits are not saved
  auto child = std::make_shared<Layer>();
  child->setName("Child");
  root->addChildLayer(child);
  root->addChildLayer(child);  // the same child twice comes back as one object

  const auto decoded = roundTrip(root);
  ASSERT_TRUE(decoded);
  EXPECT_EQ(settingsOf(*decoded), std::tuple("Root", false, false, true, 3, 2.5f, true, 90, 30));
  EXPECT_EQ(decoded->bbox(), root->bbox());
  EXPECT_EQ(decoded->objectToWorld()->mx(), root->objectToWorld()->mx());
  EXPECT_EQ(decoded->inertialToObject()->mx(), root->inertialToObject()->mx());
  EXPECT_EQ(decoded->editingTransform()->mx(), AffineTransform::kIdentity);
  ASSERT_EQ(decoded->childLayerCount(), 2);
  EXPECT_EQ(decoded->childLayers()[0]->name(), "Child");
  EXPECT_EQ(decoded->childLayers()[0], decoded->childLayers()[1]);
}

TEST(LayerArchive, MissingKeysReadAsZeroNoAndNothing) {
  const auto layer = decodeFrom<AnimatedLayer>("AnimatedLayer", [](KeyedArchiver&) {});
  ASSERT_TRUE(layer);
  // FPS 0, not the 25 of a new layer.
  EXPECT_EQ(settingsOf(*layer), std::tuple("", false, false, false, 0, 0.0f, false, 0, 0));
  EXPECT_EQ(layer->childLayerCount(), 0);
  EXPECT_EQ(layer->objectToWorld()->mx(), AffineTransform::kIdentity);
  EXPECT_EQ(layer->inertialToObject()->mx(), AffineTransform::kIdentity);

  // A stored billboard distance is taken as it stands, unclamped.
  const auto billboard = decodeFrom<Layer>(
      "Layer", [](KeyedArchiver& coder) { coder.encodeFloat(-2.0f, "billboardDistance"); });
  ASSERT_TRUE(billboard);
  EXPECT_EQ(billboard->billboardDistance(), -2.0f);
}

}  // namespace
}  // namespace cloudreel
