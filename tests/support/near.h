#pragma once
// Element-wise closeness of fixed-size arrays (points, quaternions, axis
// angles, matrices), and where a transform sends a point.

#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <string>

#include "geometry/affine_transform.h"

namespace cloudreel::testing {

template <class T, std::size_t N>
void expectNear(const std::array<T, N>& actual, const std::array<T, N>& expected,
                double tolerance = 1e-9, const std::string& what = "") {
  for (std::size_t i = 0; i < N; ++i) {
    EXPECT_NEAR(actual[i], expected[i], tolerance) << what << ", element " << i;
  }
}

inline std::array<double, 3> applied(const AffineTransform& t, std::array<double, 3> p) {
  t.multiply3Vector(p);
  return p;
}

}  // namespace cloudreel::testing
