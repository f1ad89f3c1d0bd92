// The Stack Blur walk over many lanes at once, compiled once per instruction set by
// foreach_target.h.
//
// Each lane keeps the three sums of the one-line walk: `in` over the samples ahead of the output,
// `out` over the output and those behind it, and `sum` weighing every sample of the window by
// radius + 1 minus its distance. Stepping from line x to x + 1 the window loses sample x - radius
// and gains x + radius + 1 (both clamped to the ends), and sample x + 1 moves from `in` to `out`.
// All of it is exact integer arithmetic, so a lane gives the walk's bytes whatever order the
// lanes are done in. Outputs overwrite their line, so a ring keeps the last radius + 1 lines as
// they were for the samples that leave the window later.
#include <algorithm>
#include <cstring>

#include "simd/stackblur_lanes.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/stackblur_lanes_hwy.cpp"
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

// Helpers stay in this file: other kernels' files build the same target namespaces.
namespace {

// The lanes [begin, end) of one walk, sums and ring indexed by lane.
struct LaneWalk {
  uint8_t* first;
  ptrdiff_t stride;
  size_t lanes, count;
  const StackblurWalk& walk;
  uint32_t* sum;
  uint32_t* in;
  uint32_t* out;
  uint8_t* ring;

  uint8_t* Line(size_t i) const { return first + static_cast<ptrdiff_t>(i) * stride; }
  uint8_t* RingLine(size_t i) const { return ring + (i % (walk.radius + 1)) * lanes; }
};

// The sums before the first output: sample 0 fills the radius + 1 places up to the centre,
// samples 1..radius (clamped to the last line) the places after it.
void StartLanes(const LaneWalk& w, size_t begin, size_t end) {
  const uint32_t r = w.walk.radius;
  const uint8_t* line0 = w.Line(0);
  for (size_t j = begin; j < end; ++j) {
    w.sum[j] = line0[j] * ((r + 1) * (r + 2) / 2);
    w.out[j] = line0[j] * (r + 1);
    w.in[j] = 0;
  }
  for (uint32_t i = 1; i <= r; ++i) {
    const uint8_t* line = w.Line(std::min<size_t>(i, w.count - 1));
    for (size_t j = begin; j < end; ++j) {
      w.sum[j] += line[j] * (r + 1 - i);
      w.in[j] += line[j];
    }
  }
}

// Line x's outputs for lanes [begin, end), one lane at a time, and the step to line x + 1 unless
// x is the last line.
void StepLanesOneByOne(const LaneWalk& w, size_t x, size_t begin, size_t end) {
  const size_t r = w.walk.radius, last = w.count - 1;
  uint8_t* cur = w.Line(x);
  uint8_t* saved = w.RingLine(x);
  for (size_t j = begin; j < end; ++j) saved[j] = cur[j];
  for (size_t j = begin; j < end; ++j) {
    if (w.walk.alpha && (j & 3) == 3) continue;
    const uint32_t limit = w.walk.alpha ? cur[j | 3] : 255;
    cur[j] = static_cast<uint8_t>(std::min((w.sum[j] * w.walk.mul) >> w.walk.shr, limit));
  }
  if (x == last) return;
  const uint8_t* leaving = w.RingLine(x > r ? x - r : 0);
  const uint8_t* entering = w.Line(std::min(x + r + 1, last));
  const uint8_t* next = w.Line(x + 1);
  for (size_t j = begin; j < end; ++j) {
    w.sum[j] -= w.out[j];
    w.out[j] -= leaving[j];
    w.in[j] += entering[j];
    w.sum[j] += w.in[j];
    w.out[j] += next[j];
    w.in[j] -= next[j];
  }
}

#if HWY_TARGET == HWY_SCALAR

void Walk(const LaneWalk& w) {
  StartLanes(w, 0, w.lanes);
  for (size_t x = 0; x < w.count; ++x) StepLanesOneByOne(w, x, 0, w.lanes);
}

#else

using DU = hn::ScalableTag<uint32_t>;
using DI = hn::RebindToSigned<DU>;
using D8 = hn::Rebind<uint8_t, DU>;  // one byte per 32-bit lane

template <bool kAlpha, bool kStep>
HWY_INLINE void StepVectors(const LaneWalk& w, size_t x, size_t end) {
  const DU du;
  const D8 d8;
  const size_t n = hn::Lanes(du);
  const size_t r = w.walk.radius, last = w.count - 1;
  uint8_t* cur = w.Line(x);
  uint8_t* saved = w.RingLine(x);
  const uint8_t* leaving = w.RingLine(x > r ? x - r : 0);
  const uint8_t* entering = w.Line(std::min(x + r + 1, last));
  const uint8_t* next = w.Line(std::min(x + 1, last));
  const auto mul = hn::Set(du, w.walk.mul);
  const int shr = static_cast<int>(w.walk.shr);
  // Lane 3 of every 128-bit block is a pixel's alpha when lanes are pixel bytes.
  const auto alpha_lane = hn::Eq(hn::And(hn::Iota(du, 0), hn::Set(du, 3)), hn::Set(du, 3));
  for (size_t j = 0; j < end; j += n) {
    const auto bytes = hn::LoadU(d8, cur + j);
    hn::StoreU(bytes, d8, saved + j);
    auto sum = hn::LoadU(du, w.sum + j);
    auto value = hn::ShiftRightSame(hn::Mul(sum, mul), shr);
    if (kAlpha) {
      const auto own = hn::PromoteTo(du, bytes);
      value = hn::IfThenElse(alpha_lane, own, hn::Min(value, hn::Broadcast<3>(own)));
    }
    // The value never exceeds 255, so the saturating demotion only narrows.
    hn::StoreU(hn::DemoteTo(d8, hn::BitCast(DI(), value)), d8, cur + j);
    if (!kStep) continue;
    auto in = hn::LoadU(du, w.in + j);
    auto out = hn::LoadU(du, w.out + j);
    const auto next_sample = hn::PromoteTo(du, hn::LoadU(d8, next + j));
    sum = hn::Sub(sum, out);
    out = hn::Sub(out, hn::PromoteTo(du, hn::LoadU(d8, leaving + j)));
    in = hn::Add(in, hn::PromoteTo(du, hn::LoadU(d8, entering + j)));
    sum = hn::Add(sum, in);
    out = hn::Add(out, next_sample);
    in = hn::Sub(in, next_sample);
    hn::StoreU(sum, du, w.sum + j);
    hn::StoreU(in, du, w.in + j);
    hn::StoreU(out, du, w.out + j);
  }
}

template <bool kAlpha>
void WalkVectors(const LaneWalk& w, size_t end) {
  for (size_t x = 0; x + 1 < w.count; ++x) StepVectors<kAlpha, true>(w, x, end);
  StepVectors<kAlpha, false>(w, w.count - 1, end);
}

void Walk(const LaneWalk& w) {
  // Whole vectors first; the few lanes past them go one by one with the same arithmetic.
  const size_t end = w.lanes - w.lanes % hn::Lanes(DU());
  StartLanes(w, 0, w.lanes);
  if (w.walk.alpha) {
    WalkVectors<true>(w, end);
  } else {
    WalkVectors<false>(w, end);
  }
  if (end == w.lanes) return;
  for (size_t x = 0; x < w.count; ++x) StepLanesOneByOne(w, x, end, w.lanes);
}

#endif  // HWY_TARGET == HWY_SCALAR

// dst[c * dst_pitch + 4 r .. + 3] = src[r * src_pitch + 4 c .. + 3]: 4-byte pixels turned, one
// at a time.
void TurnPixelsOneByOne(const uint8_t* src, ptrdiff_t src_pitch, uint8_t* dst, ptrdiff_t dst_pitch,
                        size_t r0, size_t r1, size_t c0, size_t c1) {
  for (size_t r = r0; r < r1; ++r) {
    for (size_t c = c0; c < c1; ++c) {
      std::memcpy(dst + static_cast<ptrdiff_t>(c) * dst_pitch + 4 * r,
                  src + static_cast<ptrdiff_t>(r) * src_pitch + 4 * c, 4);
    }
  }
}

}  // namespace

void TurnPixelsOfTarget(const uint8_t* src, ptrdiff_t src_pitch, uint8_t* dst, ptrdiff_t dst_pitch,
                        size_t rows, size_t columns) {
#if HWY_TARGET == HWY_SCALAR
  TurnPixelsOneByOne(src, src_pitch, dst, dst_pitch, 0, rows, 0, columns);
#else
  // Blocks of 4 x 4 pixels, each pixel one 32-bit lane of a 128-bit vector.
  const hn::FixedTag<uint32_t, 4> d;
  const hn::Repartition<uint64_t, decltype(d)> d64;
  const size_t rows4 = rows & ~size_t{3}, columns4 = columns & ~size_t{3};
  auto load = [&](size_t r, size_t c) {
    return hn::LoadU(
        d, reinterpret_cast<const uint32_t*>(src + static_cast<ptrdiff_t>(r) * src_pitch) + c);
  };
  auto store = [&](hn::Vec<decltype(d64)> v, size_t c, size_t r) {
    hn::StoreU(hn::BitCast(d, v), d,
               reinterpret_cast<uint32_t*>(dst + static_cast<ptrdiff_t>(c) * dst_pitch) + r);
  };
  for (size_t r = 0; r < rows4; r += 4) {
    for (size_t c = 0; c < columns4; c += 4) {
      const auto a = load(r, c), b = load(r + 1, c), e = load(r + 2, c), f = load(r + 3, c);
      const auto ab_low = hn::BitCast(d64, hn::InterleaveLower(d, a, b));
      const auto ab_high = hn::BitCast(d64, hn::InterleaveUpper(d, a, b));
      const auto ef_low = hn::BitCast(d64, hn::InterleaveLower(d, e, f));
      const auto ef_high = hn::BitCast(d64, hn::InterleaveUpper(d, e, f));
      store(hn::InterleaveLower(d64, ab_low, ef_low), c, r);
      store(hn::InterleaveUpper(d64, ab_low, ef_low), c + 1, r);
      store(hn::InterleaveLower(d64, ab_high, ef_high), c + 2, r);
      store(hn::InterleaveUpper(d64, ab_high, ef_high), c + 3, r);
    }
  }
  TurnPixelsOneByOne(src, src_pitch, dst, dst_pitch, 0, rows4, columns4, columns);
  TurnPixelsOneByOne(src, src_pitch, dst, dst_pitch, rows4, rows, 0, columns);
#endif
}

void StackblurLanesOfTarget(uint8_t* first, ptrdiff_t stride, size_t lanes, size_t count,
                            const StackblurWalk& walk, uint32_t* sums, uint8_t* ring) {
  if (lanes == 0 || count == 0) return;
  const LaneWalk w{first, stride, lanes, count, walk, sums, sums + lanes, sums + 2 * lanes, ring};
  Walk(w);
}

const char* StackblurTargetOfTarget() { return hwy::TargetName(HWY_TARGET); }

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {

HWY_EXPORT(StackblurLanesOfTarget);
HWY_EXPORT(StackblurTargetOfTarget);
HWY_EXPORT(TurnPixelsOfTarget);

void TurnPixels(const uint8_t* src, ptrdiff_t src_pitch, uint8_t* dst, ptrdiff_t dst_pitch,
                size_t rows, size_t columns) {
  HWY_DYNAMIC_DISPATCH(TurnPixelsOfTarget)(src, src_pitch, dst, dst_pitch, rows, columns);
}

void StackblurLanesVector(uint8_t* first, ptrdiff_t stride, size_t lanes, size_t count,
                          const StackblurWalk& walk, uint32_t* sums, uint8_t* ring) {
  HWY_DYNAMIC_DISPATCH(StackblurLanesOfTarget)(first, stride, lanes, count, walk, sums, ring);
}

const char* StackblurLanesTarget() { return HWY_DYNAMIC_DISPATCH(StackblurTargetOfTarget)(); }

}  // namespace tfx
#endif  // HWY_ONCE
