#pragma once
// The document the render and farm tests work on, made as a user makes one
// with `cloudreel import`: a coloured cloud of 400 points in a 2 × 2 × 2
// cube, its camera placed by the import to see all of it, a camera path of
// two frames, and the default timeline (frames 0 to 25). Test programs that
// include it define CLOUDREEL_BINARY.

#include <gtest/gtest.h>

#include "support/cli_runner.h"
#include "support/ply_text.h"
#include "support/temp_dir.h"

namespace cloudreel::testing {

inline void makeSceneDocument(const TempDir& dir) {
  PlyElement vertex{"vertex", kPlyXyzRgb, {}};
  for (int i = 0; i < 400; ++i) {
    vertex.instances.push_back({(i % 20) / 10.0 - 1, (i / 20) / 10.0 - 1, (i % 7) / 3.0 - 1, 200.0,
                                double(i % 256), 50.0});
  }
  writeFile(dir / "cloud.ply", plyText({vertex}, "ascii"));
  writeFile(dir / "path.txt", "2\n0 0 8 0 0 0\n1 0 8 0 0 0\n");
  const Outcome made =
      cloudreel(dir, {"import", "scene.reel", "cloud.ply", "--zxy-path", "path.txt"});
  ASSERT_EQ(made.status, 0) << made.err;
}

}  // namespace cloudreel::testing
