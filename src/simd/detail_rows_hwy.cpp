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

// ---- sharpen -----------------------------------------------------------------------------------

template <int kShift, class D>
HWY_INLINE hn::Vec<D> SharpenChannel(D d, hn::Vec<D> c, hn::Vec<D> up, hn::Vec<D> left,
                                     hn::Vec<D> right, hn::Vec<D> down, FloatOf<D> k) {
  const hn::RebindToFloat<D> df;
  const IntOf<D> centre = Channel<kShift>(d, c);
  const IntOf<D> lap =
      hn::Sub(hn::Sub(hn::Sub(hn::Sub(hn::ShiftLeft<2>(centre), Channel<kShift>(d, up)),
                              Channel<kShift>(d, left)),
                      Channel<kShift>(d, right)),
              Channel<kShift>(d, down));
  return ToByte(d, hn::Add(hn::ConvertTo(df, centre), hn::Mul(hn::ConvertTo(df, lap), k)));
}

template <class D>
HWY_INLINE void SharpenVectors(D d, const uint8_t* centre, ptrdiff_t line, uint8_t* dst,
                               size_t count, float k, size_t& i) {
  const FloatOf<D> vk = hn::Set(hn::RebindToFloat<D>(), k);
  const size_t n = hn::Lanes(d);
  for (; i + n <= count; i += n) {
    const uint8_t* c = centre + 4 * i;
    const hn::Vec<D> mid = LoadPixels(d, c), up = LoadPixels(d, c - line),
                     left = LoadPixels(d, c - 4), right = LoadPixels(d, c + 4),
                     down = LoadPixels(d, c + line);
    const hn::Vec<D> p = LoadPixels(d, dst + 4 * i);
    const hn::Vec<D> out = Pack(d, p, SharpenChannel<0>(d, mid, up, left, right, down, vk),
                                SharpenChannel<8>(d, mid, up, left, right, down, vk),
                                SharpenChannel<16>(d, mid, up, left, right, down, vk));
    hn::StoreU(out, d, reinterpret_cast<uint32_t*>(dst + 4 * i));
  }
}

void SharpenRowOfTarget(const uint8_t* centre, ptrdiff_t line, uint8_t* dst, size_t count,
                        float k) {
  size_t i = 0;
  SharpenVectors(hn::ScalableTag<uint32_t>(), centre, line, dst, count, k, i);
  SharpenVectors(hn::CappedTag<uint32_t, 1>(), centre, line, dst, count, k, i);
}

// ---- unsharp mask ------------------------------------------------------------------------------

template <int kShift, class D>
HWY_INLINE hn::Vec<D> UnsharpChannel(D d, hn::Vec<D> p, hn::Vec<D> b, FloatOf<D> k) {
  const hn::RebindToFloat<D> df;
  const IntOf<D> c = Channel<kShift>(d, p);
  const IntOf<D> diff = hn::Sub(c, Channel<kShift>(d, b));
  return ToByte(d, hn::Add(hn::ConvertTo(df, c), hn::Mul(hn::ConvertTo(df, diff), k)));
}

template <class D>
HWY_INLINE void UnsharpVectors(D d, uint8_t* pixels, const uint8_t* blurred, size_t count, float k,
                               size_t& i) {
  const FloatOf<D> vk = hn::Set(hn::RebindToFloat<D>(), k);
  const size_t n = hn::Lanes(d);
  for (; i + n <= count; i += n) {
    const hn::Vec<D> p = LoadPixels(d, pixels + 4 * i), b = LoadPixels(d, blurred + 4 * i);
    const hn::Vec<D> out = Pack(d, p, UnsharpChannel<0>(d, p, b, vk),
                                UnsharpChannel<8>(d, p, b, vk), UnsharpChannel<16>(d, p, b, vk));
    hn::StoreU(out, d, reinterpret_cast<uint32_t*>(pixels + 4 * i));
  }
}

void UnsharpRowOfTarget(uint8_t* pixels, const uint8_t* blurred, size_t count, float k) {
  size_t i = 0;
  UnsharpVectors(hn::ScalableTag<uint32_t>(), pixels, blurred, count, k, i);
  UnsharpVectors(hn::CappedTag<uint32_t, 1>(), pixels, blurred, count, k, i);
}

}  // namespace HWY_NAMESPACE
}  // namespace detail_rows
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {
namespace detail_rows {

HWY_EXPORT(HazeStretchRowOfTarget);
HWY_EXPORT(SharpenRowOfTarget);
HWY_EXPORT(UnsharpRowOfTarget);

}  // namespace detail_rows

void HazeStretchRow(uint8_t* pixels, const uint8_t* dark, const uint8_t* mean, size_t count,
                    float k, float air) {
  HWY_DYNAMIC_DISPATCH(detail_rows::HazeStretchRowOfTarget)(pixels, dark, mean, count, k, air);
}

void SharpenRow(const uint8_t* centre, ptrdiff_t line, uint8_t* dst, size_t count, float k) {
  HWY_DYNAMIC_DISPATCH(detail_rows::SharpenRowOfTarget)(centre, line, dst, count, k);
}

void UnsharpRow(uint8_t* pixels, const uint8_t* blurred, size_t count, float k) {
  HWY_DYNAMIC_DISPATCH(detail_rows::UnsharpRowOfTarget)(pixels, blurred, count, k);
}

}  // namespace tfx
#endif  // HWY_ONCE
