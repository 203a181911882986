#include "scene/ocean_spectrum.h"

#include <fftw3.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <mutex>
#include <new>
#include <numbers>

#include "scene/point_layer.h"

namespace cloudreel {
namespace {

constexpr float kDefaultPatchSize = 50.0f;
constexpr float kMinPatchSize = 0.1f;       // m
constexpr float kMaxPatchSize = 100000.0f;  // m
constexpr float kMaxWindSpeed = 100.0f;     // m/s, a largest wave of about 1 km

// Plans are made with FFTW_ESTIMATE, never by measuring: a measured plan
// depends on the timings of the moment, so two runs or two machines could
// transform in a different order and round differently. FFTW_NO_SIMD keeps
// the arithmetic independent of the CPU's vector instructions as well. It
// costs nothing that matters: with estimated plans the scalar transforms
// were measured no slower for 256 and 512 samples a side, and a 256 x 256
// update takes about 3.5 ms on one core, so the work is not split over
// threads either.
constexpr unsigned kPlanFlags = FFTW_ESTIMATE | FFTW_NO_SIMD;

// FFTW's planner keeps process-wide state and is not thread-safe: every
// plan is made and destroyed under this lock. Executing a plan is safe.
std::mutex& plannerMutex() {
  static std::mutex mutex;
  return mutex;
}

// The finaliser of splitmix64: a bijective scramble of 64 bits.
constexpr std::uint64_t mix64(std::uint64_t z) {
  z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ull;
  z = (z ^ (z >> 27)) * 0x94D049BB133111EBull;
  return z ^ (z >> 31);
}

// splitmix64: a small generator whose output is the same on every machine.
class SplitMix64 {
 public:
  explicit SplitMix64(std::uint64_t state) : state_(state) {}
  std::uint64_t next() { return mix64(state_ += 0x9E3779B97F4A7C15ull); }
  // Uniform in (0, 1] (never 0, so its logarithm is finite) and in [0, 1).
  double openUnit() { return static_cast<double>((next() >> 11) + 1) * 0x1p-53; }
  double unit() { return static_cast<double>(next() >> 11) * 0x1p-53; }

 private:
  std::uint64_t state_;
};

// The two independent standard normal numbers of the wave (nx, nz), by
// Box-Muller in double. Keyed by the wave numbers rather than drawn in grid
// order, so that a grid of another size over the same tile gives its
// common waves the same amplitudes.
std::complex<double> normalPair(std::uint64_t seedKey, int nx, int nz) {
  const std::uint64_t wave = (std::uint64_t{static_cast<std::uint32_t>(nx)} << 32) |
                             std::uint64_t{static_cast<std::uint32_t>(nz)};
  SplitMix64 generator(mix64(seedKey ^ wave));
  const double radius = std::sqrt(-2.0 * std::log(generator.openUnit()));
  const double angle = 2.0 * std::numbers::pi * generator.unit();
  return {radius * std::cos(angle), radius * std::sin(angle)};
}

float finiteOr(float value, float fallback) { return std::isfinite(value) ? value : fallback; }

}  // namespace

// Three N x N single-precision complex buffers and one in-place backward
// plan that transforms each of them (they share FFTW's alignment).
struct OceanSpectrum::Transform {
  explicit Transform(int n) : size(static_cast<std::size_t>(n) * static_cast<std::size_t>(n)) {
    for (auto& buffer : buffers) {
      buffer = static_cast<std::complex<float>*>(fftwf_malloc(sizeof(std::complex<float>) * size));
      if (!buffer) {
        release();
        throw std::bad_alloc();
      }
      std::fill_n(buffer, size, std::complex<float>{});
    }
    std::lock_guard lock(plannerMutex());
    plan =
        fftwf_plan_dft_2d(n, n, asFftw(buffers[0]), asFftw(buffers[0]), FFTW_BACKWARD, kPlanFlags);
  }
  ~Transform() { release(); }
  Transform(const Transform&) = delete;
  Transform& operator=(const Transform&) = delete;

  // Transforms every buffer in place. Without a plan (FFTW could not make
  // one) the buffers are cleared instead: a flat surface rather than a
  // spectrum read as if it were one.
  void run() {
    for (auto* buffer : buffers) {
      if (plan) {
        fftwf_execute_dft(plan, asFftw(buffer), asFftw(buffer));
      } else {
        std::fill_n(buffer, size, std::complex<float>{});
      }
    }
  }

  // std::complex<float> has the layout of float[2], which is FFTW's complex.
  static fftwf_complex* asFftw(std::complex<float>* data) {
    return reinterpret_cast<fftwf_complex*>(data);
  }

  void release() {
    if (plan) {
      std::lock_guard lock(plannerMutex());
      fftwf_destroy_plan(plan);
      plan = nullptr;
    }
    for (auto*& buffer : buffers) {
      fftwf_free(buffer);
      buffer = nullptr;
    }
  }

  std::size_t size;
  std::complex<float>* buffers[3] = {nullptr, nullptr, nullptr};
  fftwf_plan plan = nullptr;
};

int OceanSpectrum::clampedGridSize(int gridSize) {
  if (gridSize <= kMinGridSize) {
    return kMinGridSize;
  }
  if (gridSize >= kMaxGridSize) {
    return kMaxGridSize;
  }
  // Between two allowed sizes: the nearer, the larger on a tie.
  int lower = kMinGridSize;
  while (lower * 2 <= gridSize) {
    lower *= 2;
  }
  return gridSize - lower < lower * 2 - gridSize ? lower : lower * 2;
}

OceanParameters OceanSpectrum::clamped(const OceanParameters& parameters) {
  OceanParameters p = parameters;
  p.gridSize = clampedGridSize(parameters.gridSize);
  p.patchSize =
      std::clamp(finiteOr(parameters.patchSize, kDefaultPatchSize), kMinPatchSize, kMaxPatchSize);
  p.windSpeed = std::clamp(finiteOr(parameters.windSpeed, 0.0f), 0.0f, kMaxWindSpeed);
  float direction = std::fmod(finiteOr(parameters.windDirection, 0.0f), 360.0f);
  if (direction < 0.0f) {
    direction += 360.0f;
  }
  // A tiny negative angle rounds to 360 when wrapped; that is 0.
  p.windDirection = direction >= 360.0f ? 0.0f : direction;
  p.amplitude = std::clamp(finiteOr(parameters.amplitude, 0.0f), 0.0f, 1.0f);
  return p;
}

double OceanSpectrum::phillips(double kx, double kz, const OceanParameters& p) {
  const double k2 = kx * kx + kz * kz;
  const double windSpeed = p.windSpeed;
  const double amplitude = p.amplitude;
  const double direction = static_cast<double>(p.windDirection) * std::numbers::pi / 180.0;
  if (!std::isfinite(k2) || !(k2 > 0.0) || !std::isfinite(windSpeed) || !(windSpeed > 0.0) ||
      !std::isfinite(amplitude) || !(amplitude > 0.0) || !std::isfinite(direction)) {
    return 0.0;
  }
  const double largestWave = windSpeed * windSpeed / kGravity;  // L_w
  const double smallestWave = largestWave / 1000.0;             // l
  const double k4 = k2 * k2;
  const double kl2 = k2 * largestWave * largestWave;
  // Both vanish only when k or L_w is so small that the spectrum's
  // exp(-1/(k L_w)^2) has long since reached 0.
  if (!(k4 > 0.0) || !(kl2 > 0.0)) {
    return 0.0;
  }
  const double alongWind = (kx * std::cos(direction) + kz * std::sin(direction)) / std::sqrt(k2);
  const double value = amplitude * std::exp(-1.0 / kl2) / k4 * alongWind * alongWind *
                       std::exp(-k2 * smallestWave * smallestWave);
  return std::isfinite(value) ? value : 0.0;
}

OceanSpectrum::OceanSpectrum(const OceanParameters& parameters) : parameters_(clamped(parameters)) {
  const int n = parameters_.gridSize;
  const auto count = static_cast<std::size_t>(n) * static_cast<std::size_t>(n);
  fields_.gridSize = n;
  for (auto* field : {&fields_.height, &fields_.displacementX, &fields_.displacementZ,
                      &fields_.slopeX, &fields_.slopeZ}) {
    field->assign(count, 0.0f);
  }
  buildSpectrum();
  transform_ = std::make_unique<Transform>(n);
}

OceanSpectrum::~OceanSpectrum() = default;

void OceanSpectrum::buildSpectrum() {
  const int n = parameters_.gridSize;
  const double dk = 2.0 * std::numbers::pi / parameters_.patchSize;
  const std::uint64_t seedKey = SplitMix64(parameters_.seed).next();
  h0_.assign(static_cast<std::size_t>(n) * static_cast<std::size_t>(n), {});
  omega_.assign(h0_.size(), 0.0);
  for (int iz = 0; iz < n; ++iz) {
    for (int ix = 0; ix < n; ++ix) {
      const int nx = ix - n / 2;
      const int nz = iz - n / 2;
      const double kx = dk * nx;
      const double kz = dk * nz;
      const std::size_t i = static_cast<std::size_t>(ix) + static_cast<std::size_t>(iz) * n;
      omega_[i] = std::sqrt(kGravity * std::sqrt(kx * kx + kz * kz));
      // The Nyquist row and column stay 0: their partner -k is not on the
      // grid, and without them every field's spectrum is Hermitian.
      if (ix == 0 || iz == 0) {
        continue;
      }
      const std::complex<double> xi = normalPair(seedKey, nx, nz);
      h0_[i] = std::complex<float>(xi * (std::sqrt(phillips(kx, kz, parameters_) / 2.0) * dk));
    }
  }
}

std::complex<float> OceanSpectrum::initialAmplitude(int ix, int iz) const {
  const int n = parameters_.gridSize;
  if (ix < 0 || iz < 0 || ix >= n || iz >= n) {
    return {};
  }
  return h0_[static_cast<std::size_t>(ix) + static_cast<std::size_t>(iz) * n];
}

// Fills the three transform buffers with the packed spectra
//   [height + i slopeX], [displacementX + i slopeZ], [displacementZ]
// at `time`, each pre-multiplied by (-1)^(ix+iz) so that the transform's
// samples land on the tile centred at the origin. k and -k share their
// phase w t, and every field's value at -k is the conjugate of its value at
// k, so each pair is computed once.
void OceanSpectrum::fillSpectra(double time) {
  const int n = parameters_.gridSize;
  const auto dk = static_cast<float>(2.0 * std::numbers::pi / parameters_.patchSize);
  std::complex<float>* packed0 = transform_->buffers[0];
  std::complex<float>* packed1 = transform_->buffers[1];
  std::complex<float>* packed2 = transform_->buffers[2];
  for (int iz = 0; iz < n; ++iz) {
    for (int ix = 0; ix < n; ++ix) {
      const std::size_t i = static_cast<std::size_t>(ix) + static_cast<std::size_t>(iz) * n;
      if (ix == 0 || iz == 0) {
        packed0[i] = packed1[i] = packed2[i] = {};
        continue;
      }
      const std::size_t j =
          static_cast<std::size_t>(n - ix) + static_cast<std::size_t>(n - iz) * n;  // -k
      if (j < i) {
        continue;  // written with its partner
      }
      const double phase = omega_[i] * time;
      const auto c = static_cast<float>(std::cos(phase));
      const auto s = static_cast<float>(std::sin(phase));
      // h = h0(k) e^{iwt} + conj(h0(-k)) e^{-iwt}, times the centring sign
      // (the same at -k, as N is even).
      const std::complex<float> a = h0_[i];
      const std::complex<float> b = h0_[j];
      const float sign = ((ix + iz) & 1) ? -1.0f : 1.0f;
      const float hr = sign * (a.real() * c - a.imag() * s + b.real() * c - b.imag() * s);
      const float hi = sign * (a.real() * s + a.imag() * c - b.real() * s - b.imag() * c);
      const float kx = dk * static_cast<float>(ix - n / 2);
      const float kz = dk * static_cast<float>(iz - n / 2);
      const float k = std::sqrt(kx * kx + kz * kz);
      // At k = 0 (the centre, its own partner) every field is 0: h0 is 0
      // there, and the displacement's direction k/|k| is taken as 0.
      const float ux = k > 0.0f ? kx / k : 0.0f;
      const float uz = k > 0.0f ? kz / k : 0.0f;
      // slope = i k h, displacement = -i (k/|k|) h.
      const float sxr = -kx * hi, sxi = kx * hr;
      const float szr = -kz * hi, szi = kz * hr;
      const float dxr = ux * hi, dxi = -ux * hr;
      const float dzr = uz * hi, dzi = -uz * hr;
      // A + iB at k, and conj(A) + i conj(B) at -k.
      packed0[i] = {hr - sxi, hi + sxr};
      packed0[j] = {hr + sxi, -hi + sxr};
      packed1[i] = {dxr - szi, dxi + szr};
      packed1[j] = {dxr + szi, -dxi + szr};
      packed2[i] = {dzr, dzi};
      packed2[j] = {dzr, -dzi};
    }
  }
}

// Reads the five fields out of the transformed buffers, undoing the
// centring sign (-1)^(jx+jz).
void OceanSpectrum::unpackFields() {
  const int n = parameters_.gridSize;
  const std::complex<float>* packed0 = transform_->buffers[0];
  const std::complex<float>* packed1 = transform_->buffers[1];
  const std::complex<float>* packed2 = transform_->buffers[2];
  for (int jz = 0; jz < n; ++jz) {
    for (int jx = 0; jx < n; ++jx) {
      const std::size_t i = static_cast<std::size_t>(jx) + static_cast<std::size_t>(jz) * n;
      const float sign = ((jx + jz) & 1) ? -1.0f : 1.0f;
      fields_.height[i] = sign * packed0[i].real();
      fields_.slopeX[i] = sign * packed0[i].imag();
      fields_.displacementX[i] = sign * packed1[i].real();
      fields_.slopeZ[i] = sign * packed1[i].imag();
      fields_.displacementZ[i] = sign * packed2[i].real();
    }
  }
}

const OceanFields& OceanSpectrum::evaluate(float time) {
  fillSpectra(std::isfinite(time) ? static_cast<double>(time) : 0.0);
  transform_->run();
  unpackFields();
  return fields_;
}

bool OceanSpectrum::writeSurface(float time, float choppiness, std::span<color_point> records,
                                 std::span<float> normals) {
  const int n = parameters_.gridSize;
  const auto count = static_cast<std::size_t>(n) * static_cast<std::size_t>(n);
  if (records.size() < count || normals.size() < 3 * count) {
    return false;
  }
  const OceanFields& fields = evaluate(time);
  const float chop = finiteOr(choppiness, 0.0f);
  const float spacing = parameters_.patchSize / static_cast<float>(n);
  for (int iz = 0; iz < n; ++iz) {
    const float z0 = static_cast<float>(iz - n / 2) * spacing;
    for (int ix = 0; ix < n; ++ix) {
      const std::size_t i = static_cast<std::size_t>(ix) + static_cast<std::size_t>(iz) * n;
      const float x0 = static_cast<float>(ix - n / 2) * spacing;
      color_point& record = records[i];
      record.x = x0 + chop * fields.displacementX[i];
      record.y = fields.height[i];
      record.z = z0 + chop * fields.displacementZ[i];
      const float nx = -fields.slopeX[i];
      const float nz = -fields.slopeZ[i];
      // The length is at least 1: the upward component is 1.
      const float scale = 1.0f / std::sqrt(nx * nx + 1.0f + nz * nz);
      normals[3 * i] = nx * scale;
      normals[3 * i + 1] = scale;
      normals[3 * i + 2] = nz * scale;
    }
  }
  return true;
}

std::vector<std::uint32_t> OceanSpectrum::gridTriangles(int gridSize) {
  const auto n = static_cast<std::uint32_t>(clampedGridSize(gridSize));
  std::vector<std::uint32_t> indices;
  indices.reserve(static_cast<std::size_t>(n - 1) * (n - 1) * 6);
  for (std::uint32_t iz = 0; iz + 1 < n; ++iz) {
    for (std::uint32_t ix = 0; ix + 1 < n; ++ix) {
      const std::uint32_t corner = ix + iz * n;  // (ix, iz)
      const std::uint32_t right = corner + 1;    // (ix + 1, iz)
      const std::uint32_t below = corner + n;    // (ix, iz + 1)
      // (corner, below, right) is counter-clockwise seen from +y: its
      // normal (below - corner) x (right - corner) = (0, 1, 0) for unit
      // steps along z and x.
      indices.insert(indices.end(), {corner, below, right, right, below, below + 1});
    }
  }
  return indices;
}

}  // namespace cloudreel
