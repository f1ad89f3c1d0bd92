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
// Where the channels' mixes come from byte shuffles over a block of pixels rather than from
// gathers: below AVX-512, and with VBMI's byte permutes (with these, the round trip 1.36 to 1.44
// times as fast on an Intel Xeon, Emerald Rapids, as with gathers).
#define TFX_SHUFFLED_MIX (TFX_X86_BELOW_AVX512 || HWY_TARGET == HWY_AVX3_DL)
#if TFX_SHUFFLED_MIX
#include "simd/byte_table-inl.h"
#endif

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

// Below AVX-512 on x86 a gather costs about what its loads one at a time do. There, besides the
// mixes, RGBtoHSL's saturation is worked out and the hue's code comes from counting where it
// changes (the round trip 1.15 to 1.19 times as fast on Zen 3). Elsewhere each lane looks the two
// up: on the Xeon above, working either out was slower even with the mixes shuffled.
#if TFX_X86_BELOW_AVX512
// HslSaturationByMaxMin's entry as its builder works it out: l = (sum * 255 + 255) / 510 is at
// most 127 exactly when sum < 255. A grey has s = 0 as it should (den / 2 < den), and 510 - sum is
// 0 only for white, a grey.
HWY_INLINE VF SaturationUnits(VI cMax, VI cMin, const float*) {
  const DI di;
  const DF df;
  const VI sum = hn::Add(cMax, cMin);
  const VI den = hn::IfThenElse(hn::Lt(sum, hn::Set(di, 255)), sum, hn::Sub(hn::Set(di, 510), sum));
  const VI s =
      IntDivide(hn::Add(hn::Mul(hn::Sub(cMax, cMin), hn::Set(di, 255)), hn::ShiftRight<1>(den)),
                hn::Max(den, hn::Set(di, 1)));
  return DivideWholeBy255(df, hn::ConvertTo(df, s));
}

// hue.code[h], from the starts of its runs and one byte shuffle.
HWY_INLINE VI HueCode(VI h, const HslHueChoice& hue) {
  const DI di;
  const D8 d8;
  VI n = hn::Zero(di);
  for (int i = 0; i < kHueSteps; ++i) {
    // A true lane of the mask is -1.
    n = hn::Sub(n, hn::VecFromMask(di, hn::Gt(h, hn::Set(di, hue.stepStart[i] - 1))));
  }
  const V8 code = hn::TableLookupBytes(hn::LoadDup128(d8, hue.steps), hn::BitCast(d8, n));
  return hn::And(hn::BitCast(di, code), hn::Set(di, 255));
}
#else
HWY_INLINE VF SaturationUnits(VI cMax, VI cMin, const float* saturation) {
  return hn::GatherIndex(DF(), saturation, hn::Add(hn::ShiftLeft<8>(cMax), cMin));
}

HWY_INLINE VI HueCode(VI h, const HslHueChoice& hue) { return hn::GatherIndex(DI(), hue.code, h); }
#endif

// The round trip of the pixels `px`, whose channels through the mix tables are r, g and b.
template <int kRed>
HWY_INLINE VU RelightLanes(VU px, VI r, VI g, VI b, const float* saturation,
                           const HslHueChoice& hue) {
  const DU du;
  const DI di;
  const DF df;
  const VI c0 = ChannelAt(px, 0);
  const VI c1 = ChannelAt(px, 8);
  const VI c2 = ChannelAt(px, 16);
  const VI l =
      hn::ShiftRight<1>(hn::Add(hn::Max(c0, hn::Max(c1, c2)), hn::Min(c0, hn::Min(c1, c2))));

  // RGBtoHSL's saturation, and its hue: h is the sextant's base plus the delta of
  // the channel after the largest minus that of the one before it (the largest channel's own
  // delta is 0). A grey (d = 0) divides by 1 instead of 0: the numerators are then 0, giving the
  // 0 the members give.
  const VI cMax = hn::Max(r, hn::Max(g, b));
  const VI cMin = hn::Min(r, hn::Min(g, b));
  const VI d = hn::Sub(cMax, cMin);
  const VF sf = SaturationUnits(cMax, cMin, saturation);
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
  const VF lf = DivideWholeBy255(df, hn::ConvertTo(df, l));
  const VF onef = hn::Set(df, 1.0f);
  const VF q =
      hn::IfThenElse(hn::Gt(lf, hn::Set(df, 0.5f)), hn::Sub(hn::Add(lf, sf), hn::Mul(lf, sf)),
                     hn::Mul(hn::Add(onef, sf), lf));
  const VF p = hn::Sub(hn::Mul(hn::Set(df, 2.0f), lf), q);
  const VI hue8 = hn::And(h, k255);
  const VF along = hn::GatherIndex(df, hue.along, hue8);
  const VI code = HueCode(hue8, hue);
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

// Runs `relight` over each row's whole blocks of `step` pixels (rows without padding as one),
// asking for each a page ahead (a frame far beyond the caches streams in faster so), and over a
// row's tail through a zero-padded block, so that it sees the very same operations.
template <class Relight>
HWY_INLINE void ForEachBlock(uint8_t* pixels, size_t width, size_t height, size_t stride,
                             size_t step, const Relight& relight) {
  if (stride == 4 * width) width *= height, height = 1;
  for (size_t y = 0; y < height; ++y) {
    uint8_t* row = pixels + y * stride;
    size_t i = 0;
    for (; i + step <= width; i += step) {
      for (size_t line = 0; line < 4 * step; line += 64) {
        // Only a hint, and past the row at its end: an integer, not a pointer beyond the array.
        __builtin_prefetch(reinterpret_cast<const uint8_t*>(reinterpret_cast<uintptr_t>(row) +
                                                            4 * (i + 1024) + line),
                           1);
      }
      relight(row + 4 * i);
    }
    if (i < width) {
      HWY_ALIGN uint8_t tail[4 * HWY_MAX_BYTES] = {};
      std::memcpy(tail, row + 4 * i, 4 * (width - i));
      relight(tail);
      std::memcpy(row + 4 * i, tail, 4 * (width - i));
    }
  }
}

// The tables are prepared once for the whole image.
template <int kRed>
void RelightOf(uint8_t* pixels, size_t width, size_t height, size_t stride, const uint8_t* mixRed,
               const uint8_t* mixGreen, const uint8_t* mixBlue) {
  const DU du;
  const DI di;
  const size_t lanes = hn::Lanes(du);
  const HslHueChoice& hue = HslHueChoices();
  const float* saturation = TFX_X86_BELOW_AVX512 ? nullptr : HslSaturationByMaxMin();
#if TFX_SHUFFLED_MIX
  // A block is a vector of each channel's bytes: one lookup a channel, then its bytes widened to
  // 32-bit lanes a vector of pixels at a time.
  const D8 d8;
  const hn::Rebind<uint8_t, DI> dq;
  HWY_ALIGN uint8_t chunks[3][kChunkBytes];
  const TableVector mix[3] = {MakeTableVector(kRed == 0 ? mixRed : mixBlue, chunks[0]),
                              MakeTableVector(mixGreen, chunks[1]),
                              MakeTableVector(kRed == 0 ? mixBlue : mixRed, chunks[2])};
  ForEachBlock(pixels, width, height, stride, hn::Lanes(d8), [&](uint8_t* block) {
    V8 c0, c1, c2, alpha;
    hn::LoadInterleaved4(d8, block, c0, c1, c2, alpha);
    HWY_ALIGN uint8_t mixed[3][HWY_MAX_BYTES];
    hn::Store(mix[0].Lookup(c0), d8, mixed[0]);
    hn::Store(mix[1].Lookup(c1), d8, mixed[1]);
    hn::Store(mix[2].Lookup(c2), d8, mixed[2]);
    for (size_t q = 0; q < 4; ++q) {
      uint32_t* p = reinterpret_cast<uint32_t*>(block + 4 * q * lanes);
      const VI m0 = hn::PromoteTo(di, hn::LoadU(dq, mixed[0] + q * lanes));
      const VI m1 = hn::PromoteTo(di, hn::LoadU(dq, mixed[1] + q * lanes));
      const VI m2 = hn::PromoteTo(di, hn::LoadU(dq, mixed[2] + q * lanes));
      hn::StoreU(RelightLanes<kRed>(hn::LoadU(du, p), kRed == 0 ? m0 : m2, m1, kRed == 0 ? m2 : m0,
                                    saturation, hue),
                 du, p);
    }
  });
#else
  int32_t red[256], green[256], blue[256];
  for (int v = 0; v < 256; ++v) red[v] = mixRed[v], green[v] = mixGreen[v], blue[v] = mixBlue[v];
  ForEachBlock(pixels, width, height, stride, lanes, [&](uint8_t* block) {
    uint32_t* p = reinterpret_cast<uint32_t*>(block);
    const VU px = hn::LoadU(du, p);
    hn::StoreU(
        RelightLanes<kRed>(px, hn::GatherIndex(di, red, ChannelAt(px, kRed)),
                           hn::GatherIndex(di, green, ChannelAt(px, 8)),
                           hn::GatherIndex(di, blue, ChannelAt(px, 16 - kRed)), saturation, hue),
        du, p);
  });
#endif
}

void RelightImage(uint8_t* pixels, size_t width, size_t height, size_t stride, int red,
                  const uint8_t mixRed[256], const uint8_t mixGreen[256],
                  const uint8_t mixBlue[256]) {
  if (red == 0) {
    RelightOf<0>(pixels, width, height, stride, mixRed, mixGreen, mixBlue);
  } else {
    RelightOf<16>(pixels, width, height, stride, mixRed, mixGreen, mixBlue);
  }
}

const HslRelightRows* RelightRowsOfThisTarget() {
  static const HslRelightRows rows = {hwy::TargetName(HWY_TARGET), &RelightImage};
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
      int runs = 0;
      steps[0] = static_cast<uint8_t>(code[0]);
      for (int h = 1; h < 256; ++h) {
        // Seven changes over the 256 hues (the sextants' edges, one of them in two bytes): room
        // for eight; the tests would catch more.
        if (code[h] != code[h - 1] && runs < kHueSteps) {
          stepStart[runs++] = h;
          steps[runs] = static_cast<uint8_t>(code[h]);
        }
      }
      for (int i = runs; i < kHueSteps; ++i) stepStart[i] = 256;
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
