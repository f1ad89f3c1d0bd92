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

#include "simd/pixel_lanes-inl.h"

// floor(n / d) for 0 <= n < 2^24 and d >= 1. A quotient that is not an integer lies at least 1/d
// below the next one, while the float quotient is off by at most half an ulp, n / (d 2^24) < 1/d:
// truncating it never reaches that integer.
HWY_INLINE VI IntDivide(VI n, VI d) {
  const DF df;
  return hn::ConvertTo(DI(), hn::Div(hn::ConvertTo(df, n), hn::ConvertTo(df, d)));
}

// trunc(v * 255) as a byte.
HWY_INLINE VI ToByte(VF v) {
  return hn::And(hn::ConvertTo(DI(), hn::Mul(v, hn::Set(DF(), 255.0f))), hn::Set(DI(), 255));
}

// The channel whose code sits at bit kShift.
template <int kShift>
HWY_INLINE VI Choose(VI code, VI pByte, VI qByte, VI rampByte) {
  const DI di;
  const VI which = hn::And(hn::ShiftRight<kShift>(code), hn::Set(di, 3));
  return hn::IfThenElse(hn::Eq(which, hn::Set(di, 2)), rampByte,
                        hn::IfThenElse(hn::Eq(which, hn::Set(di, 1)), qByte, pByte));
}

template <int kRed>
HWY_INLINE VU RelightLanes(VU px, const int32_t* mixRed, const int32_t* mixGreen,
                           const int32_t* mixBlue, const float* saturation,
                           const HslHueChoice& hue) {
  const DU du;
  const DI di;
  const DF df;
  const VI r0 = ChannelAt(px, kRed);
  const VI g0 = ChannelAt(px, 8);
  const VI b0 = ChannelAt(px, 16 - kRed);
  const VI l =
      hn::ShiftRight<1>(hn::Add(hn::Max(r0, hn::Max(g0, b0)), hn::Min(r0, hn::Min(g0, b0))));
  const VI r = hn::GatherIndex(di, mixRed, r0);
  const VI g = hn::GatherIndex(di, mixGreen, g0);
  const VI b = hn::GatherIndex(di, mixBlue, b0);

  // RGBtoHSL's saturation from its table, and its hue: h is the sextant's base plus the delta of
  // the channel after the largest minus that of the one before it (the largest channel's own
  // delta is 0). A grey (d = 0) divides by 1 instead of 0: the numerators are then 0, giving the
  // 0 the members give.
  const VI cMax = hn::Max(r, hn::Max(g, b));
  const VI cMin = hn::Min(r, hn::Min(g, b));
  const VI d = hn::Sub(cMax, cMin);
  const VF sf = hn::GatherIndex(df, saturation, hn::Add(hn::ShiftLeft<8>(cMax), cMin));
  const VI dHalf = hn::ShiftRight<1>(d);
  const VI dSafe = hn::Max(d, hn::Set(di, 1));
  const VI k42 = hn::Set(di, 42);
  const auto redMax = hn::Eq(r, cMax);
  const auto greenMax = hn::AndNot(redMax, hn::Eq(g, cMax));
  // (plus, minus, base): red largest (b, g, 0), green (r, b, 85), blue (g, r, 170).
  const VI plus = hn::IfThenElse(redMax, b, hn::IfThenElse(greenMax, r, g));
  const VI minus = hn::IfThenElse(redMax, g, hn::IfThenElse(greenMax, b, r));
  const VI base = hn::IfThenElse(redMax, hn::Zero(di),
                                 hn::IfThenElse(greenMax, hn::Set(di, 85), hn::Set(di, 170)));
  const VI plusDelta = IntDivide(hn::Add(hn::Mul(hn::Sub(cMax, plus), k42), dHalf), dSafe);
  const VI minusDelta = IntDivide(hn::Add(hn::Mul(hn::Sub(cMax, minus), k42), dHalf), dSafe);
  const VI h = hn::Add(base, hn::Sub(plusDelta, minusDelta));
  const VI k255 = hn::Set(di, 255);

  // HSLtoRGB with the lightness replaced.
  const VF lf = DivideBy<255>(df, hn::ConvertTo(df, l));
  const VF onef = hn::Set(df, 1.0f);
  const VF q =
      hn::IfThenElse(hn::Gt(lf, hn::Set(df, 0.5f)), hn::Sub(hn::Add(lf, sf), hn::Mul(lf, sf)),
                     hn::Mul(hn::Add(onef, sf), lf));
  const VF p = hn::Sub(hn::Mul(hn::Set(df, 2.0f), lf), q);
  const VI hue8 = hn::And(h, k255);
  const VF along = hn::GatherIndex(df, hue.along, hue8);
  const VI code = hn::GatherIndex(di, hue.code, hue8);
  const VI pByte = ToByte(p);
  const VI qByte = ToByte(q);
  const VI rampByte = ToByte(hn::Add(p, DivideBy<60>(df, hn::Mul(hn::Sub(q, p), along))));
  const VI blue = Choose<0>(code, pByte, qByte, rampByte);
  const VI green = Choose<2>(code, pByte, qByte, rampByte);
  const VI red = Choose<4>(code, pByte, qByte, rampByte);
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
  const float* saturation = HslSaturationByMaxMin();
  const HslHueChoice& hue = HslHueChoices();
  size_t i = 0;
  for (; i + lanes <= count; i += lanes) {
    uint32_t* p = reinterpret_cast<uint32_t*>(pixels + 4 * i);
    // A frame far beyond the caches streams in faster when asked for well ahead of use.
    __builtin_prefetch(pixels + 4 * i + 4096, 1);
    hn::StoreU(RelightLanes<kRed>(hn::LoadU(du, p), mixRed, mixGreen, mixBlue, saturation, hue), du,
               p);
  }
  if (i < count) {
    // The tail through a full vector, so that it sees the very same operations.
    HWY_ALIGN uint32_t tail[HWY_MAX_BYTES / 4] = {};
    std::memcpy(tail, pixels + 4 * i, 4 * (count - i));
    hn::Store(RelightLanes<kRed>(hn::Load(du, tail), mixRed, mixGreen, mixBlue, saturation, hue),
              du, tail);
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

namespace tfx {

HWY_EXPORT(RelightRowsOfThisTarget);

const float* HslSaturationByMaxMin() {
  struct Table {
    float units[256 * 256];
    Table() {
      for (int cMax = 0; cMax < 256; ++cMax) {
        for (int cMin = 0; cMin <= cMax; ++cMin) {
          const int sum = cMax + cMin;
          const int d = cMax - cMin;
          const int l = (sum * 255 + 255) / 510;
          const int den = l <= 127 ? sum : 510 - sum;
          const int s = d == 0 ? 0 : (d * 255 + den / 2) / den;
          units[cMax * 256 + cMin] = static_cast<float>(s) / 255.0f;
        }
      }
    }
  };
  static const Table table;
  return table.units;
}

const HslHueChoice& HslHueChoices() {
  struct Table : HslHueChoice {
    Table() {
      for (int h = 0; h < 256; ++h) {
        const float degrees = static_cast<float>(h * 360) / 255.0f;
        const float hues[3] = {degrees - 120.0f, degrees, degrees + 120.0f};
        along[h] = 0.0f;
        code[h] = 0;
        for (int c = 0; c < 3; ++c) {
          float x = hues[c];
          x = x > 360.0f ? x - 360.0f : x < 0.0f ? x + 360.0f : x;
          int choice = 0;
          if (x < 60.0f) {
            choice = 2;
            along[h] = x;
          } else if (x < 180.0f) {
            choice = 1;
          } else if (x < 240.0f) {
            choice = 2;
            along[h] = 240.0f - x;
          }
          code[h] |= choice << (2 * c);
        }
      }
    }
  };
  static const Table table;
  return table;
}

const HslRelightRows& BestHslRelightRows() {
  return *HWY_DYNAMIC_DISPATCH(RelightRowsOfThisTarget)();
}

}  // namespace tfx
#endif  // HWY_ONCE
