// The detail and haze row kernels, compiled once per instruction set by foreach_target.h. One
// 32-bit lane is one pixel, byte 0 its low byte.
//
// Every lane evaluates the per-pixel form's expressions in its order and precision; the last
// pixels of a row go through the same code on one-lane vectors. Nothing is fused into a
// multiply-add: there is no MulAdd here, and the build passes -ffp-contract=off although the
// AVX2 and AVX-512 targets enable FMA instructions.
#include "simd/detail_rows.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/detail_rows_hwy.cpp"
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace detail_rows {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

template <class D>
using IntOf = hn::Vec<hn::RebindToSigned<D>>;
template <class D>
using FloatOf = hn::Vec<hn::RebindToFloat<D>>;

template <class D>
HWY_INLINE hn::Vec<D> LoadPixels(D d, const uint8_t* p) {
  return hn::LoadU(d, reinterpret_cast<const uint32_t*>(p));
}

// Byte kShift / 8 of every pixel.
template <int kShift, class D>
HWY_INLINE IntOf<D> Channel(D d, hn::Vec<D> p) {
  return hn::BitCast(hn::RebindToSigned<D>(), hn::And(hn::ShiftRight<kShift>(p), hn::Set(d, 255u)));
}

// 0 below 0, else trunc(min(v, 255)); no lane here can be NaN.
template <class D>
HWY_INLINE hn::Vec<D> ToByte(D d, FloatOf<D> v) {
  const hn::RebindToFloat<D> df;
  const FloatOf<D> limited = hn::Min(hn::Max(v, hn::Zero(df)), hn::Set(df, 255.0f));
  return hn::BitCast(d, hn::ConvertTo(hn::RebindToSigned<D>(), limited));
}

// Byte 3 of `p` with the three colour bytes put in.
template <class D>
HWY_INLINE hn::Vec<D> Pack(D d, hn::Vec<D> p, hn::Vec<D> b0, hn::Vec<D> b1, hn::Vec<D> b2) {
  return hn::Or(hn::Or(hn::And(p, hn::Set(d, 0xff000000u)), b0),
                hn::Or(hn::ShiftLeft<8>(b1), hn::ShiftLeft<16>(b2)));
}

// ---- haze removal ------------------------------------------------------------------------------

template <int kShift, class D>
HWY_INLINE hn::Vec<D> StretchChannel(D d, hn::Vec<D> p, IntOf<D> level, FloatOf<D> gain) {
  const hn::RebindToFloat<D> df;
  return ToByte(d, hn::Div(hn::ConvertTo(df, hn::Sub(Channel<kShift>(d, p), level)), gain));
}

template <class D>
HWY_INLINE void StretchVectors(D d, uint8_t* pixels, const uint8_t* dark, const uint8_t* mean,
                               size_t count, float k, float air, size_t& i) {
  const hn::RebindToSigned<D> di;
  const hn::RebindToFloat<D> df;
  const hn::Rebind<uint8_t, D> d8;
  const size_t n = hn::Lanes(d);
  for (; i + n <= count; i += n) {
    const hn::Vec<D> p = LoadPixels(d, pixels + 4 * i);
    // k <= 0.9 keeps trunc(mean * k) within a byte.
    const IntOf<D> scaled = hn::ConvertTo(
        di, hn::Mul(hn::ConvertTo(df, hn::PromoteTo(di, hn::LoadU(d8, mean + i))), hn::Set(df, k)));
    const IntOf<D> level = hn::Min(hn::PromoteTo(di, hn::LoadU(d8, dark + i)), scaled);
    const FloatOf<D> gain =
        hn::Sub(hn::Set(df, 1.0f), hn::Div(hn::ConvertTo(df, level), hn::Set(df, air)));
    const hn::Vec<D> out =
        Pack(d, p, StretchChannel<0>(d, p, level, gain), StretchChannel<8>(d, p, level, gain),
             StretchChannel<16>(d, p, level, gain));
    hn::StoreU(out, d, reinterpret_cast<uint32_t*>(pixels + 4 * i));
  }
}

void HazeStretchRowOfTarget(uint8_t* pixels, const uint8_t* dark, const uint8_t* mean, size_t count,
                            float k, float air) {
  size_t i = 0;
  StretchVectors(hn::ScalableTag<uint32_t>(), pixels, dark, mean, count, k, air, i);
  StretchVectors(hn::CappedTag<uint32_t, 1>(), pixels, dark, mean, count, k, air, i);
}

}  // namespace HWY_NAMESPACE
}  // namespace detail_rows
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {
namespace detail_rows {

HWY_EXPORT(HazeStretchRowOfTarget);

}  // namespace detail_rows

void HazeStretchRow(uint8_t* pixels, const uint8_t* dark, const uint8_t* mean, size_t count,
                    float k, float air) {
  HWY_DYNAMIC_DISPATCH(detail_rows::HazeStretchRowOfTarget)(pixels, dark, mean, count, k, air);
}

}  // namespace tfx
#endif  // HWY_ONCE
