// The ocean's wave simulation: its spectrum, its fields against a direct sum
// of the waves, its determinism and statistics, and odd parameters.
#include "scene/ocean_spectrum.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <complex>
#include <limits>
#include <numbers>
#include <vector>

#include "scene/point_layer.h"

namespace cloudreel {
namespace {

using std::numbers::pi;
using namespace std::complex_literals;

double rms(const std::vector<float>& values) {
  double sum = 0.0;
  for (float v : values) sum += double{v} * v;
  return std::sqrt(sum / static_cast<double>(values.size()));
}

TEST(OceanSpectrum, PhillipsSpectrumFollowsTheWindAndVanishesAtRestAndAcrossIt) {
  OceanParameters p;  // V = 8 m/s along +x, A = 0.002
  const double lw = 64.0 / 9.81, l = lw / 1000.0;
  for (auto [kx, kz] : {std::pair{0.3, 0.4}, {-0.05, 0.02}, {2.0, -1.0}, {0.01, 0.0}}) {
    const double k2 = kx * kx + kz * kz;
    const double expected = double{p.amplitude} * std::exp(-1.0 / (k2 * lw * lw)) / (k2 * k2) *
                            (kx * kx / k2) * std::exp(-k2 * l * l);
    EXPECT_NEAR(OceanSpectrum::phillips(kx, kz, p), expected, 1e-12 * expected) << kx << "," << kz;
  }
  EXPECT_NEAR(OceanSpectrum::phillips(0.3, 0.4, p), 0.0104865, 1e-7);  // worked by hand
  EXPECT_EQ(OceanSpectrum::phillips(0.0, 0.0, p), 0.0);
  EXPECT_EQ(OceanSpectrum::phillips(0.0, 0.7, p), 0.0);  // across the wind
  p.windDirection = 90.0f;                               // now along +z
  EXPECT_NEAR(OceanSpectrum::phillips(0.7, 0.0, p), 0.0, 1e-20);
  EXPECT_GT(OceanSpectrum::phillips(0.0, 0.7, p), 0.0);
}

// The fields by the slow sum over every wave, in double, from the documented
// amplitudes: the FFT, the packing of two fields per transform and the
// centring must reproduce it at every sample.
TEST(OceanSpectrum, FieldsAndSurfaceEqualADirectSumOfTheWaves) {
  OceanParameters p;
  p.gridSize = 64;
  p.windDirection = 30.0f;
  OceanSpectrum ocean(p);
  const int n = 64;
  const double dk = 2.0 * pi / p.patchSize, time = 2.7;
  for (int i = 0; i < n; ++i) {  // the Nyquist row and column carry no wave
    EXPECT_EQ(ocean.initialAmplitude(i, 0), std::complex<float>{});
    EXPECT_EQ(ocean.initialAmplitude(0, i), std::complex<float>{});
  }
  std::vector<std::complex<double>> unit(n);  // e^{2 pi i m / N}
  for (int m = 0; m < n; ++m) unit[m] = std::polar(1.0, 2.0 * pi * m / n);
  struct Wave {
    int nx, nz;
    std::complex<double> h;
    double kx, kz, k;
  };
  std::vector<Wave> waves;
  for (int iz = 0; iz < n; ++iz) {
    for (int ix = 0; ix < n; ++ix) {
      const double kx = dk * (ix - n / 2), kz = dk * (iz - n / 2), k = std::hypot(kx, kz);
      const auto e = std::polar(1.0, std::sqrt(9.81 * k) * time);
      const std::complex<double> a = ocean.initialAmplitude(ix, iz);
      const std::complex<double> b = ocean.initialAmplitude(n - ix, n - iz);
      waves.push_back({ix - n / 2, iz - n / 2, a * e + std::conj(b) / e, kx, kz, k});
    }
  }
  const OceanFields& fields = ocean.evaluate(static_cast<float>(time));
  // Every third row (both halves of each packed transform show in any row).
  const int rowStep = 3;
  std::vector<double> expected[5];  // height, displacement x, z, slope x, z
  for (auto& field : expected) field.resize(n * n);
  for (int jz = 0; jz < n; jz += rowStep) {
    for (int jx = 0; jx < n; ++jx) {
      std::complex<double> sum[5];
      for (const Wave& w : waves) {
        const int m = ((w.nx * (jx - n / 2) + w.nz * (jz - n / 2)) % n + n) % n;
        const auto he = w.h * unit[m];
        const double ux = w.k > 0 ? w.kx / w.k : 0, uz = w.k > 0 ? w.kz / w.k : 0;
        sum[0] += he;
        sum[1] += -1i * ux * he;
        sum[2] += -1i * uz * he;
        sum[3] += 1i * w.kx * he;
        sum[4] += 1i * w.kz * he;
      }
      for (int f = 0; f < 5; ++f) {
        EXPECT_NEAR(sum[f].imag(), 0.0, 1e-9) << "the spectrum of field " << f << " is Hermitian";
        expected[f][jx + jz * n] = sum[f].real();
      }
    }
  }
  const std::vector<float>* actual[5] = {&fields.height, &fields.displacementX,
                                         &fields.displacementZ, &fields.slopeX, &fields.slopeZ};
  for (int f = 0; f < 5; ++f) {
    double largest = 0;
    for (double v : expected[f]) largest = std::max(largest, std::abs(v));
    ASSERT_GT(largest, 1e-3) << "field " << f << " has waves";
    for (int jz = 0; jz < n; jz += rowStep) {
      for (int jx = 0; jx < n; ++jx) {
        const int i = jx + jz * n;
        ASSERT_NEAR((*actual[f])[i], expected[f][i], 2e-5 * largest)
            << f << " at " << jx << "," << jz;
      }
    }
  }

  std::vector<color_point> records(n * n, color_point{0, 0, 0, 10, 20, 30, 40});
  std::vector<float> normals(3 * n * n);
  ASSERT_TRUE(ocean.writeSurface(static_cast<float>(time), 1.5f, records, normals));
  const double spacing = p.patchSize / n, tolerance = 1e-4;
  for (auto [jx, jz] : {std::pair{0, 0}, {32, 33}, {63, 6}, {17, 48}}) {
    const int i = jx + jz * n;
    EXPECT_NEAR(records[i].x, (jx - 32) * spacing + 1.5 * expected[1][i], tolerance);
    EXPECT_NEAR(records[i].y, expected[0][i], tolerance);
    EXPECT_NEAR(records[i].z, (jz - 32) * spacing + 1.5 * expected[2][i], tolerance);
    const double length =
        std::sqrt(1 + expected[3][i] * expected[3][i] + expected[4][i] * expected[4][i]);
    EXPECT_NEAR(normals[3 * i], -expected[3][i] / length, tolerance);
    EXPECT_NEAR(normals[3 * i + 1], 1 / length, tolerance);
    EXPECT_NEAR(normals[3 * i + 2], -expected[4][i] / length, tolerance);
    EXPECT_EQ(records[i].r + records[i].g + records[i].b + records[i].luck, 100) << "colour kept";
  }
}

TEST(OceanSpectrum, TheSameSeedGivesTheSameSurfaceOnEveryRun) {
  OceanParameters p;
  p.gridSize = 64;
  OceanSpectrum first(p), second(p);
  const OceanFields& a = first.evaluate(1.5f);
  const OceanFields& b = second.evaluate(1.5f);
  for (auto field : {&OceanFields::height, &OceanFields::displacementX, &OceanFields::displacementZ,
                     &OceanFields::slopeX, &OceanFields::slopeZ}) {
    EXPECT_EQ(a.*field, b.*field);
  }
  // Literal values pin the generator, the spectrum and the transform.
  EXPECT_NEAR(a.height[0], 0.190070808, 2e-6);
  EXPECT_NEAR(a.height[32 + 32 * 64], 0.416682422, 4e-6);
  EXPECT_NEAR(a.height[10 + 50 * 64], -0.662131071, 7e-6);

  p.seed = 2;
  OceanSpectrum other(p);
  EXPECT_NE(other.evaluate(1.5f).height, a.height);
}

// The expected mean square height over a grid holding the whole spectrum is
// A pi L_w^2; it must not depend on the grid or the tile.
TEST(OceanSpectrum, RmsHeightFollowsTheSpectrumNotTheGridOrTile) {
  OceanParameters p;
  p.patchSize = 200.0f;
  p.gridSize = 256;
  const double lw = 64.0 / 9.81, expected = lw * std::sqrt(0.002 * pi);
  const double fine = rms(OceanSpectrum(p).evaluate(3.0f).height);
  EXPECT_NEAR(fine, expected, 0.3 * expected);
  p.gridSize = 64;
  const double coarse = rms(OceanSpectrum(p).evaluate(3.0f).height);
  EXPECT_NEAR(coarse, fine, 0.3 * fine);
  p.gridSize = 256;
  p.patchSize = 400.0f;
  const double wide = rms(OceanSpectrum(p).evaluate(3.0f).height);
  EXPECT_NEAR(wide, fine, 0.3 * fine);
}

TEST(OceanSpectrum, OddParametersAreClampedAndGiveAFiniteSurface) {
  const float nan = std::numeric_limits<float>::quiet_NaN();
  const float inf = std::numeric_limits<float>::infinity();
  // Grid size, patch size, wind speed and direction, amplitude; the grid size used.
  const struct {
    OceanParameters p;
    int gridSize;
  } cases[] = {
      {{100, 50, 8, 0, 0.002f}, 128},    {{4096, 50, 8, 0, 0.002f}, 512},
      {{-3, 50, 8, 0, 0.002f}, 64},      {{96, 50, 8, 0, 0.002f}, 128},
      {{64, 50, nan, 0, 0.002f}, 64},    {{64, 0, 8, 0, 0.002f}, 64},
      {{64, -inf, 1e30f, nan, inf}, 64}, {{64, 1e30f, 100, -1e-9f, -1}, 64},
  };
  for (const auto& c : cases) {
    OceanSpectrum ocean(c.p);
    const int n = ocean.gridSize();
    ASSERT_EQ(n, c.gridSize);
    EXPECT_TRUE(std::isfinite(ocean.parameters().patchSize) && ocean.parameters().patchSize > 0);
    EXPECT_TRUE(ocean.parameters().windDirection >= 0 && ocean.parameters().windDirection < 360);
    std::vector<color_point> records(n * n);
    std::vector<float> normals(3 * n * n);
    for (float time : {0.0f, 1e9f, nan}) {
      ASSERT_TRUE(ocean.writeSurface(time, nan, records, normals));
      for (const auto& r : records) ASSERT_TRUE(std::isfinite(r.x + r.y + r.z));
      for (float v : normals) ASSERT_TRUE(std::isfinite(v));
    }
    // Too short: nothing written.
    std::vector<color_point> few(n * n - 1, color_point{7, 7, 7, 1, 2, 3, 4});
    EXPECT_FALSE(ocean.writeSurface(1.0f, 1.0f, few, normals));
    EXPECT_FALSE(ocean.writeSurface(1.0f, 1.0f, records, std::span(normals).first(3 * n * n - 1)));
    EXPECT_EQ(few.front().x, 7.0f);
  }
}

TEST(OceanSpectrum, GridTrianglesCoverTheGridCounterClockwiseFromAbove) {
  const auto indices = OceanSpectrum::gridTriangles(64);
  ASSERT_EQ(indices.size(), 63u * 63u * 6u);
  EXPECT_TRUE(std::all_of(indices.begin(), indices.end(), [](auto i) { return i < 64u * 64u; }));
  EXPECT_EQ(OceanSpectrum::gridTriangles(-5), indices);  // clamped as a spectrum's grid is
  for (std::size_t t = 0; t < indices.size(); t += 3) {
    auto at = [&](std::size_t k) { return std::pair<int, int>(indices[k] % 64, indices[k] / 64); };
    auto [ax, az] = at(t);
    auto [bx, bz] = at(t + 1);
    auto [cx, cz] = at(t + 2);
    // y component of (b - a) x (c - a) with the samples in (x, 0, z).
    ASSERT_GT((bz - az) * (cx - ax) - (bx - ax) * (cz - az), 0) << "triangle " << t / 3;
  }
}

}  // namespace
}  // namespace cloudreel
