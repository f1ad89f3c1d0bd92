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

// ---- grain -------------------------------------------------------------------------------------

constexpr uint32_t kMultiplier = 1103515245u;
constexpr uint32_t kIncrement = 12345u;

// The generator advanced `steps` times in one go: state * multiplier + increment.
struct Jump {
  uint32_t multiplier = 1;
  uint32_t increment = 0;

  explicit Jump(size_t steps) {
    for (size_t s = 0; s < steps; ++s) {
      multiplier *= kMultiplier;
      increment = increment * kMultiplier + kIncrement;
    }
  }
  uint32_t operator()(uint32_t state) const { return state * multiplier + increment; }
};

// Lanes in steps of doubles: lane l generates pixel i + l, from the state 5 l values ahead.
template <class D64>
HWY_INLINE void GrainVectors(D64 d64, uint32_t* state, float scale, float* noise, size_t count,
                             size_t& i) {
  const hn::Rebind<uint32_t, D64> du;
  const hn::Rebind<int32_t, D64> di;
  const hn::Rebind<float, D64> df;
  using VU = hn::Vec<decltype(du)>;
  const size_t n = hn::Lanes(d64);
  if (i + n > count) return;
  HWY_ALIGN uint32_t start[hn::MaxLanes(du)];
  const Jump pixel(5);
  start[0] = *state;
  for (size_t l = 1; l < n; ++l) start[l] = pixel(start[l - 1]);
  // After its five values a lane skips the pixels of the other lanes.
  const Jump skip(5 * (n - 1));
  const VU multiplier = hn::Set(du, kMultiplier), increment = hn::Set(du, kIncrement);
  const VU skipMultiplier = hn::Set(du, skip.multiplier),
           skipIncrement = hn::Set(du, skip.increment);
  const auto next = [&](VU& s) {
    s = hn::Add(hn::Mul(s, multiplier), increment);
    return hn::BitCast(di, hn::And(hn::ShiftRight<16>(s), hn::Set(du, 32767u)));
  };
  VU s = hn::Load(du, start);
  for (; i + n <= count; i += n) {
    next(s);
    const auto a = next(s);
    const auto b = next(s);
    const auto c = next(s);
    const auto e = next(s);
    const auto sum = hn::Add(hn::Add(hn::Add(a, b), c), e);
    const auto normal = hn::Sub(hn::Mul(hn::PromoteTo(d64, sum), hn::Set(d64, 5.28596089837e-05)),
                                hn::Set(d64, 3.46410161514));
    const auto scaled =
        hn::Mul(hn::Mul(hn::DemoteTo(df, normal), hn::Set(df, scale)), hn::Set(df, 127.0f));
    hn::StoreU(scaled, df, noise + i);
    s = hn::Add(hn::Mul(s, skipMultiplier), skipIncrement);
  }
  *state = hn::GetLane(s);
}

void GrainNoiseOfTarget(uint32_t* state, float scale, float* noise, size_t count) {
  size_t i = 0;
  GrainVectors(hn::ScalableTag<double>(), state, scale, noise, count, i);
  GrainVectors(hn::CappedTag<double, 1>(), state, scale, noise, count, i);
}

template <class D>
HWY_INLINE void AddGrainVectors(D d, uint8_t* pixels, const float* noise, size_t count, size_t& i) {
  const hn::RebindToFloat<D> df;
  const size_t n = hn::Lanes(d);
  for (; i + n <= count; i += n) {
    const hn::Vec<D> p = LoadPixels(d, pixels + 4 * i);
    const FloatOf<D> v = hn::LoadU(df, noise + i);
    const hn::Vec<D> out = Pack(d, p, ToByte(d, hn::Add(hn::ConvertTo(df, Channel<0>(d, p)), v)),
                                ToByte(d, hn::Add(hn::ConvertTo(df, Channel<8>(d, p)), v)),
                                ToByte(d, hn::Add(hn::ConvertTo(df, Channel<16>(d, p)), v)));
    hn::StoreU(out, d, reinterpret_cast<uint32_t*>(pixels + 4 * i));
  }
}

void AddGrainRowOfTarget(uint8_t* pixels, const float* noise, size_t count) {
  size_t i = 0;
  AddGrainVectors(hn::ScalableTag<uint32_t>(), pixels, noise, count, i);
  AddGrainVectors(hn::CappedTag<uint32_t, 1>(), pixels, noise, count, i);
}

const char* DetailRowsTargetOfTarget() { return hwy::TargetName(HWY_TARGET); }

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
HWY_EXPORT(GrainNoiseOfTarget);
HWY_EXPORT(AddGrainRowOfTarget);
HWY_EXPORT(DetailRowsTargetOfTarget);

}  // namespace detail_rows

const char* DetailRowsTarget() {
  return HWY_DYNAMIC_DISPATCH(detail_rows::DetailRowsTargetOfTarget)();
}

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

void GrainNoise(uint32_t* state, float scale, float* noise, size_t count) {
  HWY_DYNAMIC_DISPATCH(detail_rows::GrainNoiseOfTarget)(state, scale, noise, count);
}

void AddGrainRow(uint8_t* pixels, const float* noise, size_t count) {
  HWY_DYNAMIC_DISPATCH(detail_rows::AddGrainRowOfTarget)(pixels, noise, count);
}

}  // namespace tfx
#endif  // HWY_ONCE
