// temperatureAdjustment's HSL round trip, compiled once per instruction set by foreach_target.h.
//
// Each lane follows CxImage::RGBtoHSL and HSLtoRGB step by step: the same float expressions in
// the same order (no MulAdd; the build passes -ffp-contract=off), and the integer divisions as
// float quotients that provably truncate to the same integer (see IntDivide).
#include <cstring>

#include "simd/hsl_relight.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/hsl_relight_hwy.cpp"
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

#include "simd/exact_divide-inl.h"

// Internal linkage: other kernel files define helpers of the same names.
namespace {

using DU = hn::ScalableTag<uint32_t>;
using DI = hn::RebindToSigned<DU>;
using DF = hn::RebindToFloat<DU>;
using VU = hn::Vec<DU>;
using VI = hn::Vec<DI>;
using VF = hn::Vec<DF>;

HWY_INLINE VI ByteAt(VU p, int shift) {
  const VU shifted = shift == 0 ? p : shift == 8 ? hn::ShiftRight<8>(p) : hn::ShiftRight<16>(p);
  return hn::BitCast(DI(), hn::And(shifted, hn::Set(DU(), 255u)));
}

// floor(n / d) for 0 <= n < 2^24 and d >= 1. A quotient that is not an integer lies at least 1/d
// below the next one, while the float quotient is off by at most half an ulp, n / (d 2^24) < 1/d:
// truncating it never reaches that integer.
HWY_INLINE VI IntDivide(VI n, VI d) {
  const DF df;
  return hn::ConvertTo(DI(), hn::Div(hn::ConvertTo(df, n), hn::ConvertTo(df, d)));
}

// HueToRGB on one hue (degrees, before wrapping), then trunc(v * 255) as a byte.
HWY_INLINE VI HueByte(VF p, VF q, VF h) {
  const DF df;
  const VF full = hn::Set(df, 360.0f);
  h = hn::IfThenElse(hn::Gt(h, full), hn::Sub(h, full),
                     hn::IfThenElse(hn::Lt(h, hn::Zero(df)), hn::Add(h, full), h));
  const auto rising = hn::Lt(h, hn::Set(df, 60.0f));
  const VF span = hn::Sub(q, p);
  const VF along = hn::IfThenElse(rising, h, hn::Sub(hn::Set(df, 240.0f), h));
  const VF ramp = hn::Add(p, DivideBy<60>(df, hn::Mul(span, along)));
  const VF v =
      hn::IfThenElse(rising, ramp,
                     hn::IfThenElse(hn::Lt(h, hn::Set(df, 180.0f)), q,
                                    hn::IfThenElse(hn::Lt(h, hn::Set(df, 240.0f)), ramp, p)));
  return hn::And(hn::ConvertTo(DI(), hn::Mul(v, hn::Set(df, 255.0f))), hn::Set(DI(), 255));
}

template <int kRed>
HWY_INLINE VU RelightLanes(VU px, const int32_t* mixRed, const int32_t* mixGreen,
                           const int32_t* mixBlue) {
  const DU du;
  const DI di;
  const DF df;
  const VI r0 = ByteAt(px, kRed);
  const VI g0 = ByteAt(px, 8);
  const VI b0 = ByteAt(px, 16 - kRed);
  const VI l =
      hn::ShiftRight<1>(hn::Add(hn::Max(r0, hn::Max(g0, b0)), hn::Min(r0, hn::Min(g0, b0))));
  const VI r = hn::GatherIndex(di, mixRed, r0);
  const VI g = hn::GatherIndex(di, mixGreen, g0);
  const VI b = hn::GatherIndex(di, mixBlue, b0);

  // RGBtoHSL's saturation and hue. A grey (d = 0) divides by 1 instead of 0: its numerators are
  // then below the divisor, giving the 0 the members give.
  const VI cMax = hn::Max(r, hn::Max(g, b));
  const VI cMin = hn::Min(r, hn::Min(g, b));
  const VI sum = hn::Add(cMax, cMin);
  const VI d = hn::Sub(cMax, cMin);
  const VI k255 = hn::Set(di, 255);
  const VI ownL =
      hn::ConvertTo(di, DivideBy<510>(df, hn::ConvertTo(df, hn::Add(hn::Mul(sum, k255), k255))));
  const VI den =
      hn::IfThenElse(hn::Lt(ownL, hn::Set(di, 128)), sum, hn::Sub(hn::Set(di, 510), sum));
  const VI one = hn::Set(di, 1);
  const VI s = IntDivide(hn::Add(hn::Mul(d, k255), hn::ShiftRight<1>(den)), hn::Max(den, one));
  const VI dHalf = hn::ShiftRight<1>(d);
  const VI dSafe = hn::Max(d, one);
  const VI k42 = hn::Set(di, 42);
  const VI rDelta = IntDivide(hn::Add(hn::Mul(hn::Sub(cMax, r), k42), dHalf), dSafe);
  const VI gDelta = IntDivide(hn::Add(hn::Mul(hn::Sub(cMax, g), k42), dHalf), dSafe);
  const VI bDelta = IntDivide(hn::Add(hn::Mul(hn::Sub(cMax, b), k42), dHalf), dSafe);
  const VI h = hn::IfThenElse(
      hn::Eq(r, cMax), hn::Sub(bDelta, gDelta),
      hn::IfThenElse(hn::Eq(g, cMax), hn::Add(hn::Set(di, 85), hn::Sub(rDelta, bDelta)),
                     hn::Add(hn::Set(di, 170), hn::Sub(gDelta, rDelta))));

  // HSLtoRGB with the lightness replaced.
  const VF lf = DivideBy<255>(df, hn::ConvertTo(df, l));
  const VF sf = DivideBy<255>(df, hn::ConvertTo(df, s));
  const VF onef = hn::Set(df, 1.0f);
  const VF q =
      hn::IfThenElse(hn::Gt(lf, hn::Set(df, 0.5f)), hn::Sub(hn::Add(lf, sf), hn::Mul(lf, sf)),
                     hn::Mul(hn::Add(onef, sf), lf));
  const VF hf = DivideBy<255>(df, hn::ConvertTo(df, hn::Mul(hn::And(h, k255), hn::Set(di, 360))));
  const VF p = hn::Sub(hn::Mul(hn::Set(df, 2.0f), lf), q);
  const VF third = hn::Set(df, 120.0f);
  const VI blue = HueByte(p, q, hn::Sub(hf, third));
  const VI green = HueByte(p, q, hf);
  const VI red = HueByte(p, q, hn::Add(hf, third));
  return hn::Or(
      hn::Or(hn::And(px, hn::Set(du, 0xff000000u)), hn::ShiftLeft<8>(hn::BitCast(du, green))),
      hn::Or(hn::ShiftLeft<kRed>(hn::BitCast(du, red)),
             hn::ShiftLeft<16 - kRed>(hn::BitCast(du, blue))));
}

template <int kRed>
void RelightOf(uint8_t* pixels, size_t count, const int32_t* mixRed, const int32_t* mixGreen,
               const int32_t* mixBlue) {
  const DU du;
  const size_t lanes = hn::Lanes(du);
  size_t i = 0;
  for (; i + lanes <= count; i += lanes) {
    uint32_t* p = reinterpret_cast<uint32_t*>(pixels + 4 * i);
    hn::StoreU(RelightLanes<kRed>(hn::LoadU(du, p), mixRed, mixGreen, mixBlue), du, p);
  }
  if (i < count) {
    // The tail through a full vector, so that it sees the very same operations.
    HWY_ALIGN uint32_t tail[HWY_MAX_BYTES / 4] = {};
    std::memcpy(tail, pixels + 4 * i, 4 * (count - i));
    hn::Store(RelightLanes<kRed>(hn::Load(du, tail), mixRed, mixGreen, mixBlue), du, tail);
    std::memcpy(pixels + 4 * i, tail, 4 * (count - i));
  }
}

void RelightRow(uint8_t* pixels, size_t count, int red, const int32_t mixRed[256],
                const int32_t mixGreen[256], const int32_t mixBlue[256]) {
  if (red == 0) {
    RelightOf<0>(pixels, count, mixRed, mixGreen, mixBlue);
  } else {
    RelightOf<16>(pixels, count, mixRed, mixGreen, mixBlue);
  }
}

const HslRelightRows* RelightRowsOfThisTarget() {
  static const HslRelightRows rows = {hwy::TargetName(HWY_TARGET), &RelightRow};
  return &rows;
}

}  // namespace
}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
#include "simd/dispatch.h"

namespace tfx {

HWY_EXPORT(RelightRowsOfThisTarget);

const HslRelightRows& BestHslRelightRows() {
  static const HslRelightRows* const best = HWY_DYNAMIC_DISPATCH(RelightRowsOfThisTarget)();
  return *best;
}

std::vector<const HslRelightRows*> SupportedHslRelightRows() {
  return EverySupportedSet(HWY_DISPATCH_TABLE(RelightRowsOfThisTarget));
}

}  // namespace tfx
#endif  // HWY_ONCE
