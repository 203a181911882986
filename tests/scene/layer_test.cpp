#include "scene/layer.h"

#include <gtest/gtest.h>

namespace cloudreel {
namespace {

TEST(Layer, CopyAppendsToTheNameSharesChildrenAndLeavesEditingStateBehind) {
  auto child = std::make_shared<Layer>();
  Layer cloud;
  cloud.setName("Cloud");
  cloud.addChildLayer(child);
  cloud.setIsModified(true);
  cloud.setIsEditing(true);
  cloud.editingTransform()->setTranslation({1, 2, 3});
  cloud.objectToWorld()->setTranslation({4, 5, 6});

  const auto copy = copyOf(cloud);
  EXPECT_EQ(copy->className(), "Layer");
  EXPECT_EQ(copy->name(), "Cloud copy");
  ASSERT_EQ(copy->childLayerCount(), 1);
  EXPECT_EQ(copy->childLayers()[0], child);
  EXPECT_FALSE(copy->isModified());
  EXPECT_FALSE(copy->isEditing());
  EXPECT_EQ(copy->editingTransform()->mx(), AffineTransform::kIdentity);
  EXPECT_EQ(copy->objectToWorld()->mx(), cloud.objectToWorld()->mx());
  EXPECT_NE(copy->objectToWorld(), cloud.objectToWorld());
}

}  // namespace
}  // namespace cloudreel
