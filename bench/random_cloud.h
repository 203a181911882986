#pragma once
// The cloud the drawing benchmarks draw: n points uniform in the cube
// [-1, 1]³ (moved along z by `zOffset`), random colours, luck uniform over
// 0-254 so every point is drawn at bucket limit 1, point size 1. The same
// seed every run.

#include <cstdint>
#include <memory>
#include <random>

#include "scene/point_layer.h"

namespace cloudreel::bench {

inline std::shared_ptr<PointLayer> randomCloud(std::int32_t n, float zOffset = 0.0f) {
  auto layer = std::make_shared<PointLayer>();
  layer->allocatePointArrayWithSize(n);
  layer->setNPoints(n);
  std::mt19937 random(7);
  std::uniform_real_distribution<float> unit(-1.0f, 1.0f);
  for (color_point& p : layer->colorPoints()) {
    p = {unit(random),
         unit(random),
         unit(random) + zOffset,
         static_cast<std::uint8_t>(random()),
         static_cast<std::uint8_t>(random()),
         static_cast<std::uint8_t>(random()),
         static_cast<std::uint8_t>(random() % 255)};
  }
  layer->setPointSize(1.0f);
  return layer;
}

}  // namespace cloudreel::bench
