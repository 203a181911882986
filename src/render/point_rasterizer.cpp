// The CPU point rasteriser: each chunk of points is projected by all threads
// at once (each its share of the points, binning the fragments by band of
// rows), then each thread writes the fragments of its own band, taking the
// threads' bins in order. No two threads write the same pixel, and within a
// band the points arrive in record order, so the result does not depend on
// the threads' timing.
//
// This file is built without contraction of products and sums into fused
// multiply-adds: the few fused ones are written out where the rasteriser
// being matched has them.

#include "render/point_rasterizer.h"

#include <algorithm>
#include <atomic>
#include <barrier>
#include <cmath>
#include <cstring>
#include <new>
#include <thread>

namespace cloudreel {

namespace {

// The fragments of one chunk take at most about this much memory, over all
// threads and bands.
constexpr std::size_t kBinBytes = std::size_t{32} << 20;
// The largest point size drawn; larger sizes are drawn at it.
constexpr int kMaxPointSize = 255;

bool hasFusedMultiplyAdd() {
#if defined(__x86_64__) || defined(__i386__)
  return __builtin_cpu_supports("fma");
#else
  return false;
#endif
}

// floor(a / 256) for any sign.
constexpr std::int64_t floorDiv256(std::int64_t a) { return a >= 0 ? a / 256 : -((255 - a) / 256); }

struct Projection {
  std::array<float, 16> m{};
  float scaleX = 0, offsetX = 0, scaleY = 0, offsetY = 0;
  int width = 0, height = 0;
  // Half the point's extent in 1/256 pixel, as the bounds below use it.
  std::int64_t below = 0, above = 0;
};

// The pixels one point covers, clipped to the frame; false when it covers
// none of them or is not drawn at all.
template <bool Fused>
[[gnu::always_inline]] inline bool projectPoint(const Projection& p, const std::uint8_t* record,
                                                std::uint16_t* box, std::uint32_t* depth) {
  float x, y, z;
  std::memcpy(&x, record, 4);
  std::memcpy(&y, record + 4, 4);
  std::memcpy(&z, record + 8, 4);
  const float* m = p.m.data();
  const float cx = ((m[0] * x + m[4] * y) + m[8] * z) + m[12];
  const float cy = ((m[1] * x + m[5] * y) + m[9] * z) + m[13];
  const float cz = ((m[2] * x + m[6] * y) + m[10] * z) + m[14];
  const float cw = ((m[3] * x + m[7] * y) + m[11] * z) + m[15];
  // Inside the clip volume; not-a-number fails every comparison and is
  // dropped, and so is a point at the eye (w = 0), whose window position
  // would be undefined.
  if (!(cx >= -cw && cx <= cw && cy >= -cw && cy <= cw && cz >= -cw && cz <= cw && cw > 0.0f)) {
    return false;
  }
  const float inverseW = 1.0f / cw;
  const float nx = cx * inverseW, ny = cy * inverseW, nz = cz * inverseW;
  float wx, wy, wz;
  if constexpr (Fused) {
    wx = __builtin_fmaf(nx, p.scaleX, p.offsetX);
    wy = __builtin_fmaf(ny, p.scaleY, p.offsetY);
    wz = __builtin_fmaf(nz, 0.5f, 0.5f);
  } else {
    wx = nx * p.scaleX + p.offsetX;
    wy = ny * p.scaleY + p.offsetY;
    wz = nz * 0.5f + 0.5f;
  }
  // Within the clip volume the window position lies within a pixel of the
  // viewport, so the snapped values are small integers.
  const auto sx = static_cast<std::int64_t>(std::nearbyint(wx * 256.0f));
  const auto sy = static_cast<std::int64_t>(std::nearbyint(wy * 256.0f));
  const std::int64_t x0 = std::max<std::int64_t>(floorDiv256(sx - p.below) + 1, 0);
  const std::int64_t x1 = std::min<std::int64_t>(floorDiv256(sx + p.above), p.width - 1);
  const std::int64_t y0 = std::max<std::int64_t>(floorDiv256(sy - p.below) + 1, 0);
  const std::int64_t y1 = std::min<std::int64_t>(floorDiv256(sy + p.above), p.height - 1);
  if (x0 > x1 || y0 > y1) {
    return false;
  }
  box[0] = static_cast<std::uint16_t>(x0);
  box[1] = static_cast<std::uint16_t>(x1);
  box[2] = static_cast<std::uint16_t>(y0);
  box[3] = static_cast<std::uint16_t>(y1);
  *depth = depthValue(wz);
  return true;
}

using Fragment = PointRasterizer::Fragment;

// Where one thread's projection puts its fragments.
struct BinsOfThread {
  Fragment* const* bins;  // one per band
  std::size_t* counts;    // fragments in each
  const std::uint16_t* bandOfRow;
};

template <bool Fused>
[[gnu::always_inline]] inline void projectRange(const Projection& p, const PointRasterBatch& batch,
                                                std::size_t begin, std::size_t end,
                                                const BinsOfThread& out) {
  for (std::size_t i = begin; i < end; ++i) {
    const std::uint8_t* record = batch.records + i * 16;
    if (record[15] >= batch.luckThreshold) {
      continue;
    }
    std::uint16_t box[4];
    Fragment f{};
    if (!projectPoint<Fused>(p, record, box, &f.depth)) {
      continue;
    }
    f.x0 = box[0];
    f.x1 = box[1];
    f.y0 = box[2];
    f.y1 = box[3];
    f.colour = batch.useFixedColour ? batch.fixedColour
                                    : (std::uint32_t{record[12]} | std::uint32_t{record[13]} << 8 |
                                       std::uint32_t{record[14]} << 16 | 0xff000000u);
    // A point taller than a band goes into each band it touches.
    const unsigned last = out.bandOfRow[f.y1];
    for (unsigned b = out.bandOfRow[f.y0]; b <= last; ++b) {
      out.bins[b][out.counts[b]++] = f;
    }
  }
}

[[gnu::target("fma")]] void projectRangeFused(const Projection& p, const PointRasterBatch& batch,
                                              std::size_t begin, std::size_t end,
                                              const BinsOfThread& out) {
  projectRange<true>(p, batch, begin, end, out);
}

void projectRangePlain(const Projection& p, const PointRasterBatch& batch, std::size_t begin,
                       std::size_t end, const BinsOfThread& out) {
  projectRange<false>(p, batch, begin, end, out);
}

}  // namespace

std::array<float, 16> combinedMatrix(const std::array<float, 16>& projection,
                                     const std::array<float, 16>& modelView) {
  std::array<float, 16> out{};
  for (int row = 0; row < 4; ++row) {
    for (int column = 0; column < 4; ++column) {
      const float* b = modelView.data() + 4 * column;
      out[4 * column + row] = projection[row] * b[0] + projection[4 + row] * b[1] +
                              projection[8 + row] * b[2] + projection[12 + row] * b[3];
    }
  }
  return out;
}

std::uint8_t colourByte(float component) {
  // Not-a-number clamps to 0.
  const float clamped = component > 0.0f ? std::min(component, 1.0f) : 0.0f;
  return static_cast<std::uint8_t>(std::nearbyint(clamped * 255.0f));
}

std::uint32_t depthValue(float windowZ) {
  const float z = windowZ > 0.0f ? std::min(windowZ, 1.0f) : 0.0f;
  const auto i = static_cast<std::uint32_t>(z * 2147483648.0f);
  return (i << 1) - (i >> 31);
}

PointRasterizer::PointRasterizer(Division division) : division_(division) {
  if (division_.threads == 0) {
    division_.threads = std::max(1u, std::thread::hardware_concurrency());
  }
  division_.pointsPerThread = std::max<std::size_t>(division_.pointsPerThread, 1);
  division_.chunk = std::max<std::size_t>(division_.chunk, 1);
}

bool PointRasterizer::prepare(const PointRasterTarget& target, unsigned threads,
                              std::size_t points) {
  try {
    chunk_ = std::clamp<std::size_t>(
        (points + threads - 1) / threads, 1,
        std::min(division_.chunk, kBinBytes / (sizeof(Fragment) * threads * threads)));
    bins_.resize(std::size_t{threads} * threads);
    binPointers_.resize(bins_.size());
    for (std::size_t i = 0; i < bins_.size(); ++i) {
      bins_[i].resize(chunk_);
      binPointers_[i] = bins_[i].data();
    }
    binCounts_.assign(threads, std::vector<std::size_t>(threads, 0));
    bandStart_.resize(threads + 1);
    for (unsigned b = 0; b <= threads; ++b) {
      bandStart_[b] = static_cast<int>(std::int64_t{target.height} * b / threads);
    }
    bandOfRow_.resize(static_cast<std::size_t>(target.height));
    for (unsigned b = 0; b < threads; ++b) {
      std::fill(bandOfRow_.begin() + bandStart_[b], bandOfRow_.begin() + bandStart_[b + 1],
                static_cast<std::uint16_t>(b));
    }
  } catch (const std::bad_alloc&) {
    bins_.clear();
    return false;
  }
  return true;
}

bool PointRasterizer::draw(const PointRasterTarget& target,
                           std::span<const PointRasterBatch> batches) {
  if (target.width <= 0 || target.height <= 0 || target.width > 65535 || target.height > 65535 ||
      target.colour == nullptr || target.depth == nullptr) {
    return true;
  }
  std::size_t total = 0;
  for (const PointRasterBatch& batch : batches) {
    total += batch.count;
  }
  const auto threads = static_cast<unsigned>(
      std::clamp<std::size_t>(total / division_.pointsPerThread, 1,
                              std::min<std::size_t>(division_.threads, target.height)));
  if (!prepare(target, threads, total)) {
    return false;
  }
  for (const PointRasterBatch& batch : batches) {
    drawBatch(target, batch, threads);
  }
  return true;
}

void PointRasterizer::drawBatch(const PointRasterTarget& target, const PointRasterBatch& batch,
                                unsigned threads) {
  if (batch.records == nullptr || batch.count == 0 || batch.luckThreshold <= 0) {
    return;
  }
  Projection p;
  p.m = combinedMatrix(batch.projection, batch.modelView);
  const float halfWidth = static_cast<float>(batch.viewport[2]) * 0.5f;
  const float halfHeight = static_cast<float>(batch.viewport[3]) * 0.5f;
  p.scaleX = halfWidth;
  p.offsetX = halfWidth + static_cast<float>(batch.viewport[0]);
  p.scaleY = halfHeight;
  p.offsetY = halfHeight + static_cast<float>(batch.viewport[1]);
  p.width = target.width;
  p.height = target.height;
  const std::int64_t size = std::clamp(batch.pointSize, 1, kMaxPointSize);
  p.below = 128 * (size + 1);
  p.above = 128 * (size - 1);
  const bool fused = hasFusedMultiplyAdd();

  // Slice s of each round, points [start + s × chunk, ...), goes into its
  // own bins, one per band.
  const auto project = [&](unsigned slice, std::size_t begin, std::size_t end) {
    std::vector<std::size_t>& counts = binCounts_[slice];
    std::fill(counts.begin(), counts.end(), 0);
    const BinsOfThread out{binPointers_.data() + std::size_t{slice} * threads, counts.data(),
                           bandOfRow_.data()};
    if (fused) {
      projectRangeFused(p, batch, begin, end, out);
    } else {
      projectRangePlain(p, batch, begin, end, out);
    }
  };
  // Band b takes the slices' bins in order, so earlier records come first.
  const auto write = [&](unsigned band) {
    const int top = bandStart_[band + 1] - 1;
    const int bottom = bandStart_[band];
    const auto width = static_cast<std::size_t>(target.width);
    for (unsigned slice = 0; slice < threads; ++slice) {
      const Fragment* f = bins_[std::size_t{slice} * threads + band].data();
      const Fragment* end = f + binCounts_[slice][band];
      for (; f != end; ++f) {
        const int y0 = std::max<int>(f->y0, bottom);
        const int y1 = std::min<int>(f->y1, top);
        for (int y = y0; y <= y1; ++y) {
          std::uint32_t* depth = target.depth + static_cast<std::size_t>(y) * width;
          std::uint32_t* colour = target.colour + static_cast<std::size_t>(y) * width;
          for (int x = f->x0; x <= f->x1; ++x) {
            if (f->depth < depth[x]) {
              depth[x] = f->depth;
              colour[x] = f->colour;
            }
          }
        }
      }
    }
  };

  // Slices and bands are handed out to whichever threads run, so the work
  // is done whatever number of them could be started.
  std::atomic<unsigned> nextSlice{0};
  std::atomic<unsigned> nextBand{0};
  const auto resetCounters = [&]() noexcept {
    nextSlice.store(0, std::memory_order_relaxed);
    nextBand.store(0, std::memory_order_relaxed);
  };
  std::barrier sync(static_cast<std::ptrdiff_t>(threads), resetCounters);
  const std::size_t round = chunk_ * threads;
  const auto run = [&] {
    for (std::size_t start = 0; start < batch.count; start += round) {
      for (unsigned s; (s = nextSlice.fetch_add(1, std::memory_order_relaxed)) < threads;) {
        const std::size_t begin = std::min(batch.count, start + s * chunk_);
        project(s, begin, std::min(batch.count, begin + chunk_));
      }
      sync.arrive_and_wait();
      for (unsigned b; (b = nextBand.fetch_add(1, std::memory_order_relaxed)) < threads;) {
        write(b);
      }
      sync.arrive_and_wait();
    }
  };
  std::vector<std::jthread> workers;
  unsigned started = 1;
  try {
    workers.reserve(threads - 1);
    for (; started < threads; ++started) {
      workers.emplace_back(run);
    }
  } catch (const std::exception&) {
    // Fewer threads do the same work: the barrier stops waiting for the
    // ones that could not be started.
    for (; started < threads; ++started) {
      sync.arrive_and_drop();
    }
  }
  run();
}

}  // namespace cloudreel
