#pragma once
// The simulation behind the ocean layer: a square tile of deep-water waves
// built from a statistical wave spectrum and brought to any moment by
// inverse FFTs, after Tessendorf's "Simulating Ocean Water".
//
// The spectrum is Phillips':
//   P(k) = A exp(-1/(k L_w)^2) / k^4 (k^.w^)^2 exp(-k^2 l^2),
// L_w = V^2/g the largest wave the wind V raises (g = 9.81 m/s^2), w^ the
// wind's direction and l = L_w/1000, which damps waves much shorter than
// the largest. Every wave vector k = 2 pi (n_x, n_z)/L of the grid gets a
// random complex amplitude
//   h0(k) = (xi_r + i xi_i) sqrt(P(k)/2) dk,   dk = 2 pi/L,
// with xi_r, xi_i independent standard normal numbers. The factor dk makes
// the sum over the grid a quadrature of the spectrum's integral, so the
// statistics of the surface depend neither on N nor on L: the expected
// mean square height is sum over k of 2 P(k) dk^2, which tends to
// A pi L_w^2 once the grid holds the whole spectrum (rms height L_w
// sqrt(A pi); a tile smaller than the largest waves holds less of it).
//
// The random numbers come from the project's own generator, keyed by the
// seed and the integer wave numbers (n_x, n_z): the same seed gives the
// same surface on every machine, and a finer grid over the same tile keeps
// every wave of a coarser one, adding only shorter waves.
//
// At time t the wave k is h(k,t) = h0(k) e^{i w t} + conj(h0(-k)) e^{-i w t}
// with w = sqrt(g |k|), and the fields at the samples x_j = (j - N/2) L/N are
//   height       = sum h(k,t) e^{i k.x}
//   displacement = sum -i (k/|k|) h(k,t) e^{i k.x}   (choppy waves)
//   slope        = sum i k h(k,t) e^{i k.x}          (the normals)
// evaluated with single-precision FFTW, two real fields per complex
// transform. The amplitudes on the row and column of the Nyquist wave
// number (n = -N/2) are zero, so every field's spectrum is exactly
// Hermitian and the packed fields separate without leakage.

#include <complex>
#include <cstdint>
#include <memory>
#include <span>
#include <vector>

namespace cloudreel {

struct color_point;

// What shapes the waves. Any values are accepted; the spectrum clamps them
// (see OceanSpectrum's constructor).
struct OceanParameters {
  int gridSize = 128;          // N: N x N samples over the tile, a power of two 64..512
  float patchSize = 50.0f;     // L: side of the square tile, in metres
  float windSpeed = 8.0f;      // V, m/s; the largest wave is L_w = V^2/g
  float windDirection = 0.0f;  // degrees in the x-z plane, from +x towards +z
  float amplitude = 0.002f;    // A, the Phillips constant
  std::uint32_t seed = 1;
};

// The five real fields of the surface at one time, N*N each, index ix + iz*N.
// Heights and displacements in metres, slopes dimensionless.
struct OceanFields {
  int gridSize = 0;
  std::vector<float> height, displacementX, displacementZ, slopeX, slopeZ;
};

class OceanSpectrum {
 public:
  static constexpr double kGravity = 9.81;  // m/s^2
  static constexpr int kMinGridSize = 64;
  static constexpr int kMaxGridSize = 512;

  // Builds h0(k) and the FFT plans from `parameters` after clamping them,
  // so that no input is refused and none gives a non-finite surface:
  // gridSize to the nearest of 64, 128, 256, 512 (anything below 64, also
  // negative, gives 64; anything above 512 gives 512); patchSize to
  // 0.1..100000 m (not finite: 50); windSpeed to 0..100 m/s (not finite:
  // 0, a calm sea); windDirection wrapped into 0..360 (not finite: 0);
  // amplitude to 0..1 (not finite: 0). parameters() answers the clamped
  // values.
  explicit OceanSpectrum(const OceanParameters& parameters);
  ~OceanSpectrum();
  // Neither copied nor moved: it owns FFT plans and buffers, and a
  // moved-from spectrum would be one more state to guard. Hold it by
  // pointer to replace it.
  OceanSpectrum(const OceanSpectrum&) = delete;
  OceanSpectrum& operator=(const OceanSpectrum&) = delete;

  const OceanParameters& parameters() const { return parameters_; }
  int gridSize() const { return parameters_.gridSize; }

  // The grid size a spectrum built with `gridSize` uses.
  static int clampedGridSize(int gridSize);
  // `parameters` as the constructor clamps them.
  static OceanParameters clamped(const OceanParameters& parameters);

  // The Phillips spectrum P(k) for the wave vector (kx, kz) in rad/m, with
  // the parameters as given. P(0) = 0, and 0 wherever an input is not
  // finite or the wind is calm.
  static double phillips(double kx, double kz, const OceanParameters& p);

  // h0(k) for the grid index (ix, iz), whose wave vector is
  // k = 2 pi (ix - N/2, iz - N/2)/L; 0 on the Nyquist row and column and
  // for an index outside the grid.
  std::complex<float> initialAmplitude(int ix, int iz) const;

  // The fields at `time` in seconds (not finite: 0), by inverse FFTs. The
  // reference stays valid, and its contents unchanged, until the next call.
  const OceanFields& evaluate(float time);

  // Writes the surface at `time`: records[i] (i = ix + iz*N) gets the
  // sample's place on the tile centred at the origin, x0 = (ix - N/2) L/N
  // and z0 likewise, moved by choppiness * displacement in x and z, with
  // y = height (y is up); normals[3i..3i+2] the unit normal
  // normalize(-slopeX, 1, -slopeZ). Colour and luck bytes are left as they
  // are. A choppiness that is not finite counts as 0. Spans shorter than N*N
  // (resp. 3*N*N) get nothing written and the answer is false; longer ones
  // keep their tail.
  bool writeSurface(float time, float choppiness, std::span<color_point> records,
                    std::span<float> normals);

  // The triangles over the grid of a spectrum built with `gridSize` (so
  // clamped as the constructor does): two per cell, (N-1)^2 cells, three
  // indices each, counter-clockwise seen from +y.
  static std::vector<std::uint32_t> gridTriangles(int gridSize);

 private:
  struct Transform;  // the FFTW buffers and plan

  void buildSpectrum();
  void fillSpectra(double time);
  void unpackFields();

  OceanParameters parameters_;
  std::vector<std::complex<float>> h0_;  // N*N, index ix + iz*N
  std::vector<double> omega_;            // w = sqrt(g|k|) per index, rad/s
  std::unique_ptr<Transform> transform_;
  OceanFields fields_;
};

}  // namespace cloudreel
