// The eight-band HSL kernel, compiled once per instruction set by foreach_target.h. Its lanes work
// on the highest, lowest and middle channel value and move the three results into place at the
// end. Each step rounds exactly as the per-pixel form in adjust/HSLAdjust.cpp does (where a step
// is rewritten, the line above it says why it rounds alike), so both give the bytes the formulas
// in HSLAdjust.h define. Nothing is fused into a multiply-add (no MulAdd, and the build passes
// -ffp-contract=off).
#ifndef TFX_SIMD_HSL_ADJUST_ROWS_SHARED
#define TFX_SIMD_HSL_ADJUST_ROWS_SHARED

#include <cstring>

#include "simd/hsl_adjust_rows.h"

namespace tfx {
namespace {

// The byte picks for hue sextant `sextant`, red at bit `red`, where the highest, lowest and
// middle channel value and alpha of a pixel lie `stride` bytes apart. The sextant rides in bits
// 28-30, which a byte shuffle ignores.
constexpr uint32_t SextantPicks(int sextant, int red, uint32_t stride) {
  // Highest (0), lowest (1) or middle (2) for red, green and blue.
  constexpr uint8_t kRoles[6][3] = {{0, 2, 1}, {2, 0, 1}, {1, 0, 2},
                                    {1, 2, 0}, {2, 1, 0}, {0, 1, 2}};
  return (kRoles[sextant][0] * stride << red) | (kRoles[sextant][1] * stride << 8) |
         (kRoles[sextant][2] * stride << (16 - red)) | (3 * stride << 24) |
         (static_cast<uint32_t>(sextant) << 28);
}

}  // namespace
}  // namespace tfx

#endif  // TFX_SIMD_HSL_ADJUST_ROWS_SHARED

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/hsl_adjust_rows_hwy.cpp"
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

#include "simd/pixel_lanes-inl.h"

#if HWY_ARCH_X86 && HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128
// Bytes of the highest, lowest and middle value and alpha of pixel i lie at 4 * role + i % 4 of
// its 16-byte block. The two saturating packs clamp to 0..255 as the rounding must; a value in
// (-1, 0) has already truncated to 0.
constexpr uint32_t kStride = 4;
constexpr uint32_t kLaneStep = 0x01010101u;
HWY_INLINE VU PackValues(VF hi, VF lo, VF mid, VU px) {
  const hn::Repartition<int16_t, DU> d16;
  const auto hiLo = hn::ReorderDemote2To(d16, SmallToInt(hi), SmallToInt(lo));
  const auto midAlpha =
      hn::ReorderDemote2To(d16, SmallToInt(mid), hn::BitCast(DI(), hn::ShiftRight<24>(px)));
#if HWY_TARGET <= HWY_AVX3
  return VU{_mm512_packus_epi16(hiLo.raw, midAlpha.raw)};
#elif HWY_TARGET == HWY_AVX2
  return VU{_mm256_packus_epi16(hiLo.raw, midAlpha.raw)};
#else
  return VU{_mm_packus_epi16(hiLo.raw, midAlpha.raw)};
#endif
}
#else
// Bytes 0..3 of pixel i: highest, lowest and middle value and alpha.
constexpr uint32_t kStride = 1;
constexpr uint32_t kLaneStep = 0x04040404u;
HWY_INLINE VU PackValues(VF hi, VF lo, VF mid, VU px) {
  const DF df;
  const auto byte = [&](VF v) {
    return hn::BitCast(DU(), SmallToInt(hn::Min(hn::Max(v, hn::Zero(df)), hn::Set(df, 255.0f))));
  };
  return hn::Or(hn::Or(byte(hi), hn::ShiftLeft<8>(byte(lo))),
                hn::Or(hn::ShiftLeft<16>(byte(mid)), hn::And(px, hn::Set(DU(), 0xff000000u))));
}
#endif

// Picks for every sextant, each lane's own byte offset within its block added.
struct LanePicks {
  VU of[6];
};

template <int kRed>
HWY_INLINE LanePicks MakeLanePicks() {
  const DU du;
  const VU lane = hn::Mul(hn::And(hn::Iota(du, 0), hn::Set(du, 3u)), hn::Set(du, kLaneStep));
  LanePicks picks;
  for (int n = 0; n < 6; ++n) {
    picks.of[n] = hn::Add(hn::Set(du, SextantPicks(n, kRed, kStride)), lane);
  }
  return picks;
}

// The picked bytes of `values`; bits 4-6 of a pick are not part of its byte index.
HWY_INLINE VU PickBytes(VU values, VU picks) {
#if HWY_ARCH_X86 && HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128
  return hn::TableLookupBytes(values, picks);
#else
  return hn::TableLookupBytes(values, hn::And(picks, hn::Set(DU(), 0x0f0f0f0fu)));
#endif
}

// The shift, k and lightness of each lane's table entry (four floats, at float `index`).
HWY_INLINE void LookUpEntries(const float* table, VI index, VF& shift, VF& k, VF& light) {
  const DF df;
#if HWY_ARCH_X86 && HWY_TARGET == HWY_AVX2
  // Gathers cost AMD's Zen 3 more than a 16-byte load an entry and the interleaves that part its
  // three values.
  HWY_ALIGN int32_t at[8];
  hn::Store(index, DI(), at);
  const hn::Half<DF> dh;
  const auto pair = [&](int q) {
    return hn::Combine(df, hn::LoadU(dh, table + at[4 + q]), hn::LoadU(dh, table + at[q]));
  };
  // Block m of a_q is the entry of lane 4m + q.
  const VF a0 = pair(0), a1 = pair(1), a2 = pair(2), a3 = pair(3);
  TransposeBlocks(a0, a1, a2, a3, shift, k, light);
#else
  shift = hn::GatherIndex(df, table, index);
  k = hn::GatherIndex(df, table + 1, index);
  light = hn::GatherIndex(df, table + 2, index);
#endif
}

// One vector of pixels; red at bit kRed, blue at bit 16 - kRed.
template <int kRed>
HWY_INLINE VU AdjustPixels(VU px, const float* table, const LanePicks& sextantPicks) {
  const DU du;
  const DI di;
  const DF df;
  const VI r = ChannelAt(px, kRed);
  const VI g = ChannelAt(px, 8);
  const VI b = ChannelAt(px, 16 - kRed);
  const VI mx = hn::Max(r, hn::Max(g, b));
  const VI mn = hn::Min(r, hn::Min(g, b));
  const VI c = hn::Sub(mx, mn);
  const VI c2 = hn::ShiftLeft<1>(c);
  const VI c4 = hn::ShiftLeft<2>(c);
  const VI c6 = hn::Add(c4, c2);
  const VI pRed = hn::Add(hn::Sub(g, b), hn::IfThenElseZero(hn::Lt(g, b), c6));
  const VI p = hn::IfThenElse(
      hn::Eq(r, mx), pRed,
      hn::IfThenElse(hn::Eq(g, mx), hn::Add(c2, hn::Sub(b, r)), hn::Add(c4, hn::Sub(r, g))));
  // floor(256 p / c) from a float quotient: below 1536 its ulp is 2^-13, while a quotient that is
  // not an integer lies at least 1/c >= 1/255 from one, so rounding never crosses an integer.
  // Greys divide by 1 instead; every step below leaves them as they are. The integers here are
  // far below 2^24, so their floats and these products are exact.
  const VF one = hn::Set(df, 1.0f);
  const VF cf = hn::ConvertTo(df, c);
  const VF pf = hn::ConvertTo(df, p);
  const VF divisor = hn::Max(cf, one);
  const VI j = SmallToInt(hn::Div(hn::Mul(pf, hn::Set(df, 256.0f)), divisor));
  const VI index = hn::ShiftLeft<2>(j);
  VF shift, k, light;
  LookUpEntries(table, index, shift, k, light);
  const VF zero = hn::Zero(df);
  // Greys and hue steps no band touches (lightness +0 exactly) come out as they went in.
  const auto keep = hn::Or(hn::Eq(c, hn::Zero(di)), hn::Eq(hn::BitCast(di, light), hn::Zero(di)));
  if (hn::AllTrue(di, keep)) return px;

  const VF mxf = hn::ConvertTo(df, mx);
  const VF mnf = hn::ConvertTo(df, mn);

  // Hue: the sextant of q is the number of thresholds n c (n = 1..5) it reaches; the masks are
  // nested, so the last one reached gives that sextant's picks.
  const VF turn = hn::ConvertTo(df, c6);
  VF q = hn::Add(pf, hn::Mul(shift, cf));
  q = hn::IfThenElse(hn::Lt(q, zero), hn::Add(q, turn),
                     hn::IfThenElse(q >= turn, hn::Sub(q, turn), q));
  // The thresholds are integers below 2^11, so these sums are exact.
  const VF t2 = hn::Add(cf, cf);
  const VF t4 = hn::Add(t2, t2);
  VU picks = sextantPicks.of[0];
  picks = hn::IfThenElse(hn::RebindMask(du, q >= cf), sextantPicks.of[1], picks);
  picks = hn::IfThenElse(hn::RebindMask(du, q >= t2), sextantPicks.of[2], picks);
  picks = hn::IfThenElse(hn::RebindMask(du, q >= hn::Add(t2, cf)), sextantPicks.of[3], picks);
  picks = hn::IfThenElse(hn::RebindMask(du, q >= t4), sextantPicks.of[4], picks);
  picks = hn::IfThenElse(hn::RebindMask(du, q >= hn::Add(t4, cf)), sextantPicks.of[5], picks);
  // sextant * c below 2^11: exact, the threshold the masks picked.
  const VF x =
      hn::Sub(q, hn::Mul(hn::ConvertTo(df, hn::BitCast(di, hn::ShiftRight<28>(picks))), cf));
  // The one channel that is neither the highest nor the lowest rises in even sextants and falls
  // in odd ones (bit 28 of the picks, moved to the sign). A shift of 0 needs no lane of its own:
  // all of this is then exact integer arithmetic that gives back the channels themselves.
  const auto falls = hn::Lt(hn::BitCast(di, hn::ShiftLeft<3>(picks)), hn::Zero(di));
  const VF mid = hn::IfThenElse(hn::RebindMask(df, falls), hn::Sub(mxf, x), hn::Add(mnf, x));

  // Saturation around the lightness, no further than the chroma limit of that lightness. A
  // factor of 1 makes s exactly 1 (the limit is never below c) and leaves every value as it is;
  // greys get s = 0 around their own value. The limit 255 - |sum - 255| is the lesser of sum
  // and 510 - sum, all exact in float.
  const VF sum = hn::Add(mxf, mnf);
  const VF m = hn::Mul(sum, hn::Set(df, 0.5f));
  const VF limit = hn::Min(sum, hn::Sub(hn::Set(df, 510.0f), sum));
  const VF s = hn::Div(hn::Min(hn::Mul(cf, k), limit), divisor);
  // mx - m is exactly c / 2 and mn - m its negative, whose product with s is the negated one.
  const VF h = hn::Mul(hn::Mul(cf, hn::Set(df, 0.5f)), s);
  const VF hi = hn::Add(m, h);
  const VF lo = hn::Sub(m, h);
  const VF md = hn::Add(m, hn::Mul(hn::Sub(mid, m), s));

  // Lightness towards white or black, faded out towards grey. c / 64 is exact as c * 2^-6.
  // l = 0 adds (255 - v) * 0 or v * 0, a zero, which leaves v as it is.
  const VF fade = hn::Min(one, hn::Mul(cf, hn::Set(df, 1.0f / 64.0f)));
  const VF l = hn::Mul(light, fade);
  const auto up = hn::Gt(l, zero);
  const VF white = hn::Set(df, 255.0f);
  // Each value lit and rounded, v + 0.5 to be truncated; the bytes then moved to their channels.
  const auto lit = [&](VF v) {
    v = hn::Add(v, hn::Mul(hn::IfThenElse(up, hn::Sub(white, v), v), l));
    return hn::Add(v, hn::Set(df, 0.5f));
  };
  return PickBytes(PackValues(lit(hi), lit(lo), lit(md), px), picks);
}

template <int kRed>
void AdjustRowsOf(uint8_t* dst, size_t dstStride, const uint8_t* src, size_t srcStride, size_t rows,
                  size_t count, const float* table) {
  const DU du;
  const size_t lanes = hn::Lanes(du);
  const LanePicks picks = MakeLanePicks<kRed>();
  for (size_t y = 0; y < rows; ++y) {
    const uint8_t* in = src + y * srcStride;
    uint8_t* out = dst + y * dstStride;
    size_t i = 0;
    for (; i + lanes <= count; i += lanes) {
      // A frame far beyond the caches streams in faster when asked for well ahead of use.
      __builtin_prefetch(in + 4 * i + 4096);
      const VU px = hn::LoadU(du, reinterpret_cast<const uint32_t*>(in + 4 * i));
      hn::StoreU(AdjustPixels<kRed>(px, table, picks), du,
                 reinterpret_cast<uint32_t*>(out + 4 * i));
    }
    if (i < count) {
      // The tail through a full vector, so that it sees the very same operations.
      alignas(64) uint32_t tail[HWY_MAX_BYTES / 4] = {};
      std::memcpy(tail, in + 4 * i, 4 * (count - i));
      hn::Store(AdjustPixels<kRed>(hn::Load(du, tail), table, picks), du, tail);
      std::memcpy(out + 4 * i, tail, 4 * (count - i));
    }
  }
}

// `rows` rows of `count` packed 4-byte pixels from `src` into `dst` (which may be `src`), each
// `stride` bytes after the last; red is byte 0 in RGBA order, byte 2 otherwise.
void HslAdjustRowsOfTarget(uint8_t* dst, size_t dstStride, const uint8_t* src, size_t srcStride,
                           size_t rows, size_t count, const float* table, bool rgba) {
  if (rgba) {
    AdjustRowsOf<0>(dst, dstStride, src, srcStride, rows, count, table);
  } else {
    AdjustRowsOf<16>(dst, dstStride, src, srcStride, rows, count, table);
  }
}

const char* HslAdjustRowsTargetOfTarget() { return hwy::TargetName(HWY_TARGET); }

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {

HWY_EXPORT(HslAdjustRowsOfTarget);
HWY_EXPORT(HslAdjustRowsTargetOfTarget);

void HslAdjustRows(uint8_t* dst, size_t dstStride, const uint8_t* src, size_t srcStride,
                   size_t rows, size_t count, const float* table, bool rgba) {
  HWY_DYNAMIC_DISPATCH(HslAdjustRowsOfTarget)
  (dst, dstStride, src, srcStride, rows, count, table, rgba);
}

const char* HslAdjustRowsTarget() { return HWY_DYNAMIC_DISPATCH(HslAdjustRowsTargetOfTarget)(); }

}  // namespace tfx
#endif  // HWY_ONCE
