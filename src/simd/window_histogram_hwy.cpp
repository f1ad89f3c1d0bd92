// The percentile filter's row, compiled once per instruction set by foreach_target.h.
//
// Counters add and subtract modulo 256 in any order, so whole-vector byte arithmetic gives the
// walk's histogram exactly. The scan looks for the smallest value v whose running count reaches
// the target; that bin is never empty unless the target is 0, where the first non-empty bin is
// wanted, which is the same search with a target of 1. Sums of eight bins find the group of eight
// holding v, walking from the group of the previous pixel's v, which the next window's rarely
// leaves far behind; then the bins of that group find v.
#include <algorithm>

#include "simd/window_histogram.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/window_histogram_hwy.cpp"
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

// Helpers stay in this file: other kernels' files build the same target namespaces.
namespace {

constexpr uint32_t kNone = 256;

// The target of a window of `count` pixels, at least 1 as explained above.
uint32_t TargetOf(int64_t count, float fraction) {
  const int64_t target =
      std::min(static_cast<int64_t>(static_cast<float>(count + 1) * fraction), count);
  // No histogram of 256 counters holds more than 256 * 255 pixels.
  return static_cast<uint32_t>(std::clamp<int64_t>(target, 1, 256 * 255 + 1));
}

// The sums of one window's bins: groups[g] over bins 8g..8g+7, and blocks[b] over the groups
// b * per_block .. (b + 1) * per_block - 1, per_block being the groups of one vector.
struct BinSums {
  HWY_ALIGN uint64_t groups[32];
  uint64_t blocks[32];
  uint32_t per_block;

  // The total of the groups before `group`. Block totals keep this off the chain from one
  // pixel's result to the next pixel's scan.
  uint64_t Below(uint32_t group) const {
    const uint32_t block = group / per_block;
    uint64_t below = 0;
    for (uint32_t b = 0; b < block; ++b) below += blocks[b];
    for (uint32_t g = block * per_block; g < group; ++g) below += groups[g];
    return below;
  }
};

// The smallest v of `bins` whose running count reaches `target`, walking from `group`; kNone
// when the total stays below.
uint32_t Scan(const uint8_t* bins, const BinSums& sums, uint32_t group, uint32_t target) {
  // Find the group whose running totals before and after it straddle the target. Before group
  // 0 the total is 0, below any target.
  uint64_t below = sums.Below(group);
  if (below >= target) {
    while (below >= target) below -= sums.groups[--group];
  } else {
    while (group < 32 && below + sums.groups[group] < target) below += sums.groups[group++];
    if (group == 32) return kNone;
  }
  // The bins of the group: the number whose running total stays below the target is v's
  // offset, counted without a branch, since where it stops varies from pixel to pixel.
  const uint8_t* group_bins = bins + 8 * group;
  uint32_t offset = 0;
  for (int i = 0; i < 7; ++i) {
    below += group_bins[i];
    offset += below < target ? 1 : 0;
  }
  return 8 * group + offset;
}

#if HWY_TARGET == HWY_SCALAR

void Combine(uint8_t* window, const uint8_t* add, const uint8_t* remove, BinSums& sums) {
  sums.per_block = 32;
  sums.blocks[0] = 0;
  for (uint32_t g = 0; g < 32; ++g) {
    uint64_t sum = 0;
    for (uint32_t b = 8 * g; b < 8 * g + 8; ++b) {
      if (remove != nullptr) window[b] = static_cast<uint8_t>(window[b] - remove[b]);
      if (add != nullptr) window[b] = static_cast<uint8_t>(window[b] + add[b]);
      sum += window[b];
    }
    sums.groups[g] = sum;
    sums.blocks[0] += sum;
  }
}

#else

// window += add - remove (either may be null), then the sums of the window's bins.
void Combine(uint8_t* HWY_RESTRICT window, const uint8_t* add, const uint8_t* remove,
             BinSums& sums) {
  const hn::ScalableTag<uint8_t> d8;
  const hn::Repartition<uint64_t, decltype(d8)> d64;
  const size_t n = hn::Lanes(d8);
  sums.per_block = static_cast<uint32_t>(n / 8);
  for (size_t i = 0; i < 256; i += n) {
    auto v = hn::Load(d8, window + i);
    if (remove != nullptr) v = hn::Sub(v, hn::LoadU(d8, remove + i));
    if (add != nullptr) v = hn::Add(v, hn::LoadU(d8, add + i));
    hn::Store(v, d8, window + i);
    const auto groups = hn::SumsOf8(v);
    hn::Store(groups, d64, sums.groups + i / 8);
    sums.blocks[i / n] = hn::GetLane(hn::SumOfLanes(d64, groups));
  }
}

#endif

}  // namespace

void WindowHistogramRowOfTarget(const uint8_t* columns, uint8_t* out, int64_t width, int64_t radius,
                                int64_t rows, float fraction) {
  HWY_ALIGN uint8_t window[256] = {};
  BinSums sums{};
  uint32_t group = 0;  // where the previous pixel's value was found
  const int64_t first_right = std::min(width - 1, radius);
  for (int64_t j = 0; j <= first_right; ++j) Combine(window, columns + j * 256, nullptr, sums);
  for (int64_t x = 0; x < width; ++x) {
    const int64_t left = std::max<int64_t>(0, x - radius);
    const int64_t right = std::min(width - 1, x + radius);
    if (x > 0) {
      // The walk's slide: the column behind the window leaves, and the column at the right edge
      // enters unless that edge is clamped and the window is narrower than 2 radius + 1.
      const uint8_t* remove = x - radius > 0 ? columns + (x - radius - 1) * 256 : nullptr;
      const uint8_t* add =
          right == width - 1 && right - left < 2 * radius ? nullptr : columns + right * 256;
      Combine(window, add, remove, sums);
    }
    const uint32_t target = TargetOf((right - left + 1) * rows, fraction);
    const uint32_t v = Scan(window, sums, group, target);
    if (v != kNone) group = v / 8;
    out[x] = static_cast<uint8_t>(v);  // none gives 256, whose low byte is 0
  }
}

const char* WindowHistogramTargetOfTarget() { return hwy::TargetName(HWY_TARGET); }

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {

HWY_EXPORT(WindowHistogramRowOfTarget);
HWY_EXPORT(WindowHistogramTargetOfTarget);

void WindowHistogramRow(const uint8_t* columns, uint8_t* out, int64_t width, int64_t radius,
                        int64_t rows, float fraction) {
  HWY_DYNAMIC_DISPATCH(WindowHistogramRowOfTarget)(columns, out, width, radius, rows, fraction);
}

const char* WindowHistogramTarget() {
  return HWY_DYNAMIC_DISPATCH(WindowHistogramTargetOfTarget)();
}

}  // namespace tfx
#endif  // HWY_ONCE
