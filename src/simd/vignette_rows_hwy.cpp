// The vignette blend, compiled once per instruction set by foreach_target.h.
//
// Every lane evaluates vignettePixel's float expressions in the same order (no MulAdd; the build
// passes -ffp-contract=off), so every set gives its bytes.
#include <cstring>

#include "adjust/VignetteRows.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/vignette_rows_hwy.cpp"
#include <hwy/cache_control.h>
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

#include "simd/exact_divide-inl.h"
#include "simd/pixel_lanes-inl.h"

// kZeroWeight: the blend's zeroWeight, where the curve's weight need not be computed.
template <bool kZeroWeight>
struct BlendVector {
  float onePlusA, e, b;

  HWY_INLINE VU operator()(VU p, VF g) const {
    const DU du;
    const DI di;
    const DF df;
    const VU byte = hn::Set(du, 255u);
    const VF blue = hn::ConvertTo(df, hn::BitCast(di, hn::And(p, byte)));
    const VF green = hn::ConvertTo(df, hn::BitCast(di, hn::And(hn::ShiftRight<8>(p), byte)));
    const VF red = hn::ConvertTo(df, hn::BitCast(di, hn::And(hn::ShiftRight<16>(p), byte)));
    const VF one = hn::Set(df, 1.0f);
    const VF top = hn::Set(df, 255.0f);
    const VF inv = hn::Sub(one, g);
    const VF gain = hn::Add(hn::Mul(hn::Set(df, onePlusA), inv), hn::Mul(hn::Set(df, e), g));
    const VF sr = hn::Mul(red, gain), sg = hn::Mul(green, gain), sb = hn::Mul(blue, gain);
    VF w = hn::Zero(df);
    if (!kZeroWeight) {
      const VF mean = DivideBy<255>(df, DivideBy<3>(df, hn::Add(hn::Add(sr, sg), sb)));
      w = hn::Mul(hn::Mul(hn::Sub(one, mean), hn::Mul(inv, inv)), hn::Set(df, b));
    }
    const auto curved = hn::Lt(g, one);
    const auto channel = [&](VF v) {
      const VF curve =
          hn::Sub(top, hn::Div(hn::Mul(hn::Sub(top, v), hn::Sub(top, hn::Mul(w, v))), top));
      const VF out = hn::IfThenElse(curved, curve, v);
      // 0 below 0, else trunc(min(255, v)); NaN gives 255.
      const VF limited = hn::Max(hn::IfThenElse(hn::Lt(out, top), out, top), hn::Zero(df));
      return hn::BitCast(du, hn::ConvertTo(di, limited));
    };
    return hn::Or3(hn::Or(hn::And(p, hn::Set(du, 0xff000000u)), channel(sb)),
                   hn::ShiftLeft<8>(channel(sg)), hn::ShiftLeft<16>(channel(sr)));
  }
};

// How far ahead of the pixels it reads a run asks for its input: the hardware's own prefetch
// stops at every 4 KiB page, and a chain of effects finds its frames in memory, not in cache.
constexpr size_t kPrefetchAhead = 4096;

template <bool kZeroWeight>
void BlendRunOf(uint8_t* dst, const uint8_t* src, const float* mask, size_t count,
                const VignetteBlend& blend) {
  const DU du;
  const DF df;
  const BlendVector<kZeroWeight> kernel{1.0f + blend.a, blend.e, blend.b};
  const size_t lanes = hn::Lanes(du);
  size_t i = 0;
  for (; i + lanes <= count; i += lanes) {
    // Only a hint, and past the row at its end: an integer, not a pointer beyond the array.
    hwy::Prefetch(reinterpret_cast<const uint8_t*>(reinterpret_cast<uintptr_t>(src) + 4 * i +
                                                   kPrefetchAhead));
    const auto* from = reinterpret_cast<const uint32_t*>(src + 4 * i);
    hn::StoreU(kernel(hn::LoadU(du, from), hn::LoadU(df, mask + i)), du,
               reinterpret_cast<uint32_t*>(dst + 4 * i));
  }
  if (i < count) {
    // The tail through zero-padded copies, so that it gets the same arithmetic.
    HWY_ALIGN uint32_t words[HWY_MAX_BYTES / 4] = {};
    HWY_ALIGN float weights[HWY_MAX_BYTES / 4] = {};
    std::memcpy(words, src + 4 * i, 4 * (count - i));
    std::memcpy(weights, mask + i, 4 * (count - i));
    hn::Store(kernel(hn::Load(du, words), hn::Load(df, weights)), du, words);
    std::memcpy(dst + 4 * i, words, 4 * (count - i));
  }
}

void BlendRun(uint8_t* dst, const uint8_t* src, const float* mask, size_t count,
              const VignetteBlend& blend) {
  if (blend.zeroWeight) {
    BlendRunOf<true>(dst, src, mask, count, blend);
  } else {
    BlendRunOf<false>(dst, src, mask, count, blend);
  }
}

const VignetteKernel* KernelOfThisTarget() {
  static const VignetteKernel kernel = {hwy::TargetName(HWY_TARGET), &BlendRun};
  return &kernel;
}

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace tfx {

HWY_EXPORT(KernelOfThisTarget);

const VignetteKernel& BestVignetteKernel() { return *HWY_DYNAMIC_DISPATCH(KernelOfThisTarget)(); }

}  // namespace tfx
#endif  // HWY_ONCE
