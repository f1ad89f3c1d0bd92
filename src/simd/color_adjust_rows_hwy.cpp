// The colour-adjust row kernels, compiled once per instruction set by foreach_target.h.
//
// Every lane gives the bytes of the per-pixel forms in adjust/ColorAdjust.cpp, bit for bit: it
// evaluates their float and integer expressions in the same order and precision, or a rewrite
// that provably rounds the same (each one says why next to it). Nothing is fused into a
// multiply-add: there is no MulAdd here, and the build passes -ffp-contract=off although the
// AVX2 and AVX-512 targets enable FMA instructions.
#include <cmath>
#include <cstring>
#include <type_traits>

#include "simd/color_adjust_rows.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/color_adjust_rows_hwy.cpp"
#include <hwy/cache_control.h>
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

// Vibrance and saturation see each pixel as a 32-bit lane, byte 0 being the low byte; the table
// lookup sees bytes.
#include "simd/pixel_lanes-inl.h"

// ---- Table lookup ------------------------------------------------------------------------------

#include "simd/byte_table-inl.h"
#include "simd/exact_divide-inl.h"

// ---- Per-pixel arithmetic on 32-bit lanes ------------------------------------------------------

HWY_INLINE VI Channel0(VU p) { return ChannelAt(p, 0); }
HWY_INLINE VI Channel1(VU p) { return ChannelAt(p, 8); }
HWY_INLINE VI Channel2(VU p) { return ChannelAt(p, 16); }

HWY_INLINE VU Alpha(VU p) { return hn::And(p, hn::Set(DU(), 0xff000000u)); }

// Alpha of `p` with the three colour channels (each 0..255) put back.
HWY_INLINE VU Pack(VU p, VI c0, VI c1, VI c2) {
  const DU du;
  return hn::Or3(hn::Or(Alpha(p), hn::BitCast(du, c0)), hn::ShiftLeft<8>(hn::BitCast(du, c1)),
                 hn::ShiftLeft<16>(hn::BitCast(du, c2)));
}

// Toward zero; out-of-range values and NaN give INT_MIN as in the per-pixel form, where
// ConvertTo alone would saturate to INT_MAX (and may not be handed NaN).
HWY_INLINE VI TruncToInt(VF v) {
  const DF df;
  const DI di;
  const auto in_range =
      hn::And(hn::Ge(v, hn::Set(df, -2147483648.0f)), hn::Lt(v, hn::Set(df, 2147483648.0f)));
  return hn::IfThenElse(hn::RebindMask(di, in_range),
                        hn::ConvertTo(di, hn::IfThenElseZero(in_range, v)),
                        hn::Set(di, hwy::LimitsMin<int32_t>()));
}

// v clamped to [0, 255], ready for truncation: the per-pixel form's 0 below 0, else
// trunc(min(255, v)). kNanSafe maps NaN to 255 as that form does; without it a NaN lane's result
// depends on the target's Min and Max.
template <bool kNanSafe>
HWY_INLINE VF ClampToByteRange(VF v) {
  const DF df;
  const VF top = hn::Set(df, 255.0f);
  const VF capped = kNanSafe ? hn::IfThenElse(hn::Lt(v, top), v, top) : hn::Min(v, top);
  return hn::Max(capped, hn::Zero(df));
}

// trunc(v) for v in [0, 255], as the bit pattern of trunc(v) + 2^23: 0x4b000000 + the byte.
HWY_INLINE VU ByteBits(VF v) {
  const DF df;
  return hn::BitCast(DU(), hn::Add(hn::Trunc(v), hn::Set(df, 8388608.0f)));
}

// Pack for channels given as ByteBits. Shifting left by 8 or 16 pushes the 0x4b out of the lane,
// so only channel 0 needs masking.
HWY_INLINE VU PackByteBits(VU p, VU b0, VU b1, VU b2) {
  const DU du;
  return hn::Or3(hn::OrAnd(Alpha(p), b0, hn::Set(du, 255u)), hn::ShiftLeft<8>(b1),
                 hn::ShiftLeft<16>(b2));
}

// (channel * (k + 256) - luma * k) >> 8 with 32-bit wrap-around, as in the per-pixel form,
// rearranged to (channel << 8) + (channel - luma) * k: equal modulo 2^32, one multiply fewer.
HWY_INLINE VI MixChannel(VI c, VI luma, VU k) {
  const DU du;
  const DI di;
  const VU mixed =
      hn::Add(hn::ShiftLeft<8>(hn::BitCast(du, c)), hn::Mul(hn::BitCast(du, hn::Sub(c, luma)), k));
  return hn::Max(hn::Min(hn::ShiftRight<8>(hn::BitCast(di, mixed)), hn::Set(di, 255)),
                 hn::Zero(di));
}

// MixChannel when |(channel - luma) * k| stays below 2^30: nothing wraps, and the channel comes
// out of the shift whole, ((c << 8) + x) >> 8 being c + (x >> 8).
HWY_INLINE VI MixChannelSmall(VI c, VI luma, VI k) {
  const DI di;
  const VI mixed = hn::Add(c, hn::ShiftRight<8>(hn::Mul(hn::Sub(c, luma), k)));
  return hn::Max(hn::Min(mixed, hn::Set(di, 255)), hn::Zero(di));
}

// Vibrance's luma of a pixel whose largest and smallest channel are mx and mn, and the product
// of its mask's weight and the strength, still to be truncated.
HWY_INLINE VF VibranceProduct(VI mx, VI mn, float strength, VI* luma) {
  const DI di;
  const DF df;
  *luma = hn::ShiftRight<1>(hn::Add(mx, mn));
  // Of the three masks (channel - luma, floored at 0) the smallest is always 0 and the largest
  // is mx - luma, so the luma of the mask is (mx - luma) >> 1.
  const VI weight = hn::And(hn::Neg(hn::ShiftRight<1>(hn::Sub(mx, *luma))), hn::Set(di, 255));
  return hn::Mul(hn::ConvertTo(df, weight), hn::Set(df, strength));
}

// kSmall: 255 * |strength| rounds below 2^22. Then so does every product of a weight and the
// strength (rounding is monotonic), and k * 255 stays below 2^30.
template <bool kSmall>
struct VibranceVector {
  float strength;

  HWY_INLINE VU operator()(VU p) const {
    const DU du;
    const VI c0 = Channel0(p), c1 = Channel1(p), c2 = Channel2(p);
    VI luma;
    const VF product = VibranceProduct(hn::Max(c0, hn::Max(c1, c2)), hn::Min(c0, hn::Min(c1, c2)),
                                       strength, &luma);
    if (kSmall) {
      const VI k = SmallToInt(product);
      return Pack(p, MixChannelSmall(c0, luma, k), MixChannelSmall(c1, luma, k),
                  MixChannelSmall(c2, luma, k));
    }
    const VU k = hn::BitCast(du, TruncToInt(product));
    return Pack(p, MixChannel(c0, luma, k), MixChannel(c1, luma, k), MixChannel(c2, luma, k));
  }
};

// Only grey pixels can make a NaN when the gain is finite, and they are restored whole; a NaN or
// infinite sigma needs kNanSafe.
template <bool kIncrease, bool kNanSafe>
struct SaturationVector {
  float sigma;
  float fixedGain;  // 1 / (1 - sigma) - 1, or 1 + sigma when decreasing

  HWY_INLINE VU operator()(VU p) const {
    const DU du;
    const DF df;
    const VI c0 = Channel0(p), c1 = Channel1(p), c2 = Channel2(p);
    const VF f0 = hn::ConvertTo(df, c0), f1 = hn::ConvertTo(df, c1), f2 = hn::ConvertTo(df, c2);
    const VI mx = hn::Max(c0, hn::Max(c1, c2));
    const VI mn = hn::Min(c0, hn::Min(c1, c2));
    const VF sum = DivideWholeBy255(df, hn::ConvertTo(df, hn::Add(mx, mn)));
    const VF delta = DivideWholeBy255(df, hn::ConvertTo(df, hn::Sub(mx, mn)));
    // l * 255 with l = sum / 2: halving is exact, so this rounds the same product once.
    const VF lv = hn::Mul(sum, hn::Set(df, 127.5f));
    VF o0, o1, o2;
    if (kIncrease) {
      // The per-pixel form divides by l < 0.5 ? sum : 2 - sum. Below 1, 2 - sum exceeds sum; from
      // 1 on, it is exact and at most 1, so the smaller of the two is that divisor.
      const VF one = hn::Set(df, 1.0f);
      const VF s = hn::Div(delta, hn::Min(sum, hn::Sub(hn::Set(df, 2.0f), sum)));
      const VF a = hn::IfThenElse(hn::Ge(hn::Add(s, hn::Set(df, sigma)), one),
                                  hn::Sub(hn::Div(one, s), one), hn::Set(df, fixedGain));
      o0 = hn::Add(f0, hn::Mul(hn::Sub(f0, lv), a));
      o1 = hn::Add(f1, hn::Mul(hn::Sub(f1, lv), a));
      o2 = hn::Add(f2, hn::Mul(hn::Sub(f2, lv), a));
    } else {
      const VF gain = hn::Set(df, fixedGain);
      o0 = hn::Add(lv, hn::Mul(hn::Sub(f0, lv), gain));
      o1 = hn::Add(lv, hn::Mul(hn::Sub(f1, lv), gain));
      o2 = hn::Add(lv, hn::Mul(hn::Sub(f2, lv), gain));
    }
    const VU adjusted = PackByteBits(p, ByteBits(ClampToByteRange<kNanSafe>(o0)),
                                     ByteBits(ClampToByteRange<kNanSafe>(o1)),
                                     ByteBits(ClampToByteRange<kNanSafe>(o2)));
    // Grey pixels are left as they are.
    return hn::IfThenElse(hn::RebindMask(du, hn::Eq(mx, mn)), p, adjusted);
  }
};

// Each channel times its own gain, limited as the per-pixel forms limit a float.
struct ScaleVector {
  float gain0, gain1, gain2;

  HWY_INLINE VU operator()(VU p) const {
    const DF df;
    const auto scaled = [&](VI c, float gain) {
      return ByteBits(ClampToByteRange<true>(hn::Mul(hn::ConvertTo(df, c), hn::Set(df, gain))));
    };
    return PackByteBits(p, scaled(Channel0(p), gain0), scaled(Channel1(p), gain1),
                        scaled(Channel2(p), gain2));
  }
};

// A lookup per channel in the row of the brightest channel; the gathers read four bytes from the
// entry on, of which the first counts.
struct BrightestTableVector {
  const uint8_t* table;

  HWY_INLINE VU operator()(VU p) const {
    const DU du;
    const DI di;
    const VU byte = hn::Set(du, 255u);
    const VU c0 = hn::And(p, byte), c1 = hn::And(hn::ShiftRight<8>(p), byte),
             c2 = hn::And(hn::ShiftRight<16>(p), byte);
    const VU row = hn::ShiftLeft<8>(hn::Max(hn::Max(c0, c1), c2));
    const auto* base = reinterpret_cast<const int32_t*>(table);
    const auto look = [&](VU c) {
      return hn::And(hn::BitCast(du, hn::GatherOffset(di, base, hn::BitCast(di, hn::Or(row, c)))),
                     byte);
    };
    return hn::Or3(hn::Or(Alpha(p), look(c0)), hn::ShiftLeft<8>(look(c1)),
                   hn::ShiftLeft<16>(look(c2)));
  }
};

// A pixel's three colour channels and their largest, smallest and middle value.
struct Ranked {
  VI c0, c1, c2, mx, mn, mid;
};

HWY_INLINE Ranked Rank(VU p) {
  Ranked r;
  r.c0 = Channel0(p);
  r.c1 = Channel1(p);
  r.c2 = Channel2(p);
  const VI low = hn::Min(r.c0, r.c1), high = hn::Max(r.c0, r.c1);
  r.mx = hn::Max(high, r.c2);
  r.mn = hn::Min(low, r.c2);
  r.mid = hn::Max(low, hn::Min(high, r.c2));
  return r;
}

#if HWY_TARGET != HWY_SCALAR
// Byte kByte of each pixel in its bytes 0..2 (byte 3 is left 0).
template <int kByte>
HWY_INLINE V8 SpreadByte(VU p) {
  const D8 d8;
  alignas(16) static constexpr uint8_t kPattern[16] = {
      kByte,     kByte,     kByte,     0x80, 4 + kByte,  4 + kByte,  4 + kByte,  0x80,
      8 + kByte, 8 + kByte, 8 + kByte, 0x80, 12 + kByte, 12 + kByte, 12 + kByte, 0x80};
  return hn::TableLookupBytesOr0(hn::BitCast(d8, p), hn::LoadDup128(d8, kPattern));
}

// Byte by byte: each colour byte of `p` equal to the largest becomes byte 0 of `top`'s lane,
// else each equal to the smallest byte `kBottom` of `bottom`'s, else byte 0 of `middle`'s; alpha
// is kept.
template <int kBottom>
HWY_INLINE VU PickByRank(VU p, const Ranked& r, VU top, VU bottom, VU middle) {
  const DU du;
  const D8 d8;
  const V8 pixel = hn::BitCast(d8, p);
  const V8 out =
      hn::IfThenElse(hn::Eq(pixel, SpreadByte<0>(hn::BitCast(du, r.mx))), SpreadByte<0>(top),
                     hn::IfThenElse(hn::Eq(pixel, SpreadByte<0>(hn::BitCast(du, r.mn))),
                                    SpreadByte<kBottom>(bottom), SpreadByte<0>(middle)));
  return hn::BitCast(du, hn::IfThenElse(AlphaBytes(), pixel, out));
}

#if HWY_TARGET == HWY_AVX3_DL
// ScaleVector through a table per channel of the same products, built by the caller.
struct ScaleTablesVector {
  ByteTable blue, green, red;

  HWY_INLINE VU operator()(VU p) const {
    const __m512i x = hn::BitCast(D8(), p).raw;
    __m512i out = _mm512_mask_blend_epi8(0x2222222222222222ull, blue(x), green(x));
    out = _mm512_mask_blend_epi8(0x4444444444444444ull, out, red(x));
    return hn::BitCast(DU(), V8{_mm512_mask_blend_epi8(0x8888888888888888ull, out, x)});
  }
};

// BrightestTableVector with two gathers instead of three: the largest channel's entry, on the
// table's diagonal, comes from a byte table; the smallest and middle channels' from the gathers.
// A channel equal to the largest or smallest takes that one's entry, which is its own.
struct BrightestPairVector {
  const uint8_t* table;
  ByteTable diagonal;

  HWY_INLINE VU operator()(VU p) const {
    const DU du;
    const DI di;
    const Ranked r = Rank(p);
    const VI row = hn::ShiftLeft<8>(r.mx);
    const auto* base = reinterpret_cast<const int32_t*>(table);
    const auto look = [&](VI c) {
      return hn::BitCast(du, hn::GatherOffset(di, base, hn::Or(row, c)));
    };
    const VU top = hn::BitCast(du, V8{diagonal(hn::BitCast(D8(), r.mx).raw)});
    return PickByRank<0>(p, r, top, look(r.mn), look(r.mid));
  }
};
#endif  // HWY_TARGET == HWY_AVX3_DL

// MixChannelSmall when k fits 16 bits as well: the product is then one multiply-add of 16-bit
// halves, `k16` holding k's low half under a zero upper half and (channel - luma)'s low half
// holding the difference.
HWY_INLINE VI MixChannelShort(VI c, VI luma, VI k16) {
  const DI di;
  const hn::Repartition<int16_t, DI> d16;
  VI odd = hn::Zero(di);
  const VI product = hn::RearrangeToOddPlusEven(
      hn::ReorderWidenMulAccumulate(di, hn::BitCast(d16, hn::Sub(c, luma)), hn::BitCast(d16, k16),
                                    hn::Zero(di), odd),
      odd);
  const VI mixed = hn::Add(c, hn::ShiftRight<8>(product));
  return hn::Max(hn::Min(mixed, hn::Set(di, 255)), hn::Zero(di));
}
#endif

// The entries of FusedColourTables::ends at `index`: their low halves in `low`, their high
// halves as floats in `high`.
HWY_INLINE void LookUpEnds(const uint64_t* table, VI index, VU* low, VF* high) {
#if HWY_TARGET == HWY_SCALAR
  const uint64_t entry = table[hn::GetLane(index)];
  const auto upper = static_cast<uint32_t>(entry >> 32);
  float centre;
  std::memcpy(&centre, &upper, sizeof(centre));
  *low = hn::Set(DU(), static_cast<uint32_t>(entry));
  *high = hn::Set(DF(), centre);
#else
  // Two narrow gathers from the entries' byte offsets (the low half first: little-endian): fewer
  // instructions than wide gathers and the shuffles that would part their halves.
  const VI offset = hn::ShiftLeft<3>(index);
  const auto* halves = reinterpret_cast<const int32_t*>(table);
  *low = hn::BitCast(DU(), hn::GatherOffset(DI(), halves, offset));
  *high = hn::BitCast(DF(), hn::GatherOffset(DI(), halves + 1, offset));
#endif
}

// The tone curve through `tone` (TableVector, or a direct read in scalar code), then vibrance
// and saturation. What the two give the largest and the smallest channel depends on that pair
// alone and comes from FusedColourTables::ends, with saturation's inputs; only the middle channel
// is worked out, with the per-pixel forms' expressions (vibrance as VibranceVector<true>). A
// channel equal to the largest or smallest takes that one's result, which is what working it out
// would give.
template <bool kTone, bool kVibrance, bool kSaturate, bool kIncrease, class Tone>
struct FusedColourVector {
  Tone tone;
  const FusedColourTables* t;

  HWY_INLINE VU operator()(VU raw) const {
    const DU du;
    const DI di;
    const DF df;
    const VU p = kTone ? tone(raw) : raw;
    const Ranked r = Rank(p);
    const VI mx = r.mx, mn = r.mn;
    const VI index = hn::Or(hn::ShiftLeft<8>(mx), mn);
    VU ends;
    VF gain;
    LookUpEnds(t->ends, index, &ends, &gain);
    VI mid = r.mid;
    if (kVibrance) {
      VI luma;
      const VI k = SmallToInt(VibranceProduct(mx, mn, t->strength, &luma));
#if HWY_TARGET == HWY_SCALAR
      mid = MixChannelSmall(mid, luma, k);
#else
      mid = MixChannelShort(mid, luma, hn::And(k, hn::Set(di, 0xffff)));
#endif
    }
    if (kSaturate) {
      // l * 255 is half the sum of the pair after vibrance, exactly, for every sum up to 510.
      const VF lv =
          hn::Mul(hn::ConvertTo(df, hn::BitCast(di, hn::ShiftRight<16>(ends))), hn::Set(df, 0.5f));
      if (!kIncrease) gain = hn::Set(df, t->fixedGain);
      const VF f = hn::ConvertTo(df, mid);
      const VF o = kIncrease ? hn::Add(f, hn::Mul(hn::Sub(f, lv), gain))
                             : hn::Add(lv, hn::Mul(hn::Sub(f, lv), gain));
      mid = SmallToInt(ClampToByteRange<false>(o));
    }
#if HWY_TARGET == HWY_SCALAR
    const VI top = hn::BitCast(di, hn::And(ends, hn::Set(du, 255u)));
    const VI bottom = hn::BitCast(di, hn::And(hn::ShiftRight<8>(ends), hn::Set(du, 255u)));
    const auto pick = [&](VI c) {
      return hn::IfThenElse(hn::Eq(c, mx), top, hn::IfThenElse(hn::Eq(c, mn), bottom, mid));
    };
    return Pack(p, pick(r.c0), pick(r.c1), pick(r.c2));
#else
    return PickByRank<1>(p, r, ends, ends, hn::BitCast(du, mid));
#endif
  }
};

#if HWY_TARGET != HWY_SCALAR
// Bytes 0..2 of each lane the channels limited to 0..255, byte 3 the alpha of `p`. On x86 the
// channels may lie anywhere in the int32 range: packing with signed saturation to 16 bits and then
// unsigned to 8 limits them, in five operations where limiting each at both ends, shifting and
// joining took twelve. Elsewhere they must be 0..255 already, as LimitAbove leaves them there.
HWY_INLINE VU PackLimited(VU p, VI c0, VI c1, VI c2) {
#if HWY_ARCH_X86 && HWY_TARGET == HWY_AVX2
  const __m256i alpha = _mm256_srli_epi32(p.raw, 24);
  // Per 128-bit block: c0 of its four pixels, then c1, c2 and alpha; the shuffle interleaves them.
  const __m256i bytes =
      _mm256_packus_epi16(_mm256_packs_epi32(c0.raw, c1.raw), _mm256_packs_epi32(c2.raw, alpha));
  const __m256i order = _mm256_setr_epi8(0, 4, 8, 12, 1, 5, 9, 13, 2, 6, 10, 14, 3, 7, 11, 15, 0, 4,
                                         8, 12, 1, 5, 9, 13, 2, 6, 10, 14, 3, 7, 11, 15);
  return VU{_mm256_shuffle_epi8(bytes, order)};
#elif HWY_ARCH_X86 && (HWY_TARGET == HWY_SSE4 || HWY_TARGET == HWY_SSSE3)
  const __m128i alpha = _mm_srli_epi32(p.raw, 24);
  const __m128i bytes =
      _mm_packus_epi16(_mm_packs_epi32(c0.raw, c1.raw), _mm_packs_epi32(c2.raw, alpha));
  const __m128i order = _mm_setr_epi8(0, 4, 8, 12, 1, 5, 9, 13, 2, 6, 10, 14, 3, 7, 11, 15);
  return VU{_mm_shuffle_epi8(bytes, order)};
#else
  return Pack(p, c0, c1, c2);
#endif
}

// What PackLimited needs of a float channel before truncation. On x86 truncation takes every
// value below 0 to at most 0 (out of range to INT_MIN), which PackLimited takes to 0, so only
// values from 2^31 up, which would not truncate into range, need limiting first.
HWY_INLINE VF LimitAbove(VF v) {
#if TFX_X86_BELOW_AVX512
  return hn::Min(v, hn::Set(DF(), 255.0f));
#else
  return ClampToByteRange<false>(v);
#endif
}

// LimitAbove for saturation that increases. Its gain is then below 255: sat is at least 1 / 255,
// and 1 / (1 - sigma) - 1 applies only where sat < 1 - sigma. With |f - lv| at most 127.5 every
// result lies far inside the int32 range, which truncation on x86 takes as PackLimited needs.
HWY_INLINE VF LimitAboveIncreasing(VF v) {
#if TFX_X86_BELOW_AVX512
  return v;
#else
  return LimitAbove(v);
#endif
}

// Byte kByte of each pixel alone in its lane: Channel1 and Channel2 in one byte shuffle each,
// instead of a shift and a mask.
template <int kByte>
HWY_INLINE VI LaneByte(VU p) {
  const D8 d8;
  alignas(16) static constexpr uint8_t kPattern[16] = {
      kByte,     0x80, 0x80, 0x80, 4 + kByte,  0x80, 0x80, 0x80,
      8 + kByte, 0x80, 0x80, 0x80, 12 + kByte, 0x80, 0x80, 0x80};
  return hn::BitCast(DI(),
                     hn::TableLookupBytesOr0(hn::BitCast(d8, p), hn::LoadDup128(d8, kPattern)));
}

// Channel0, Channel1 and Channel2 of each lane, by byte shuffles on x86.
HWY_INLINE void ColourChannels(VU p, VI c[3]) {
  c[0] = Channel0(p);
#if TFX_X86_BELOW_AVX512
  c[1] = LaneByte<1>(p);
  c[2] = LaneByte<2>(p);
#else
  c[1] = Channel1(p);
  c[2] = Channel2(p);
#endif
}

// FusedColourVector with every channel worked out as it works out the middle one, and only
// saturation's gain looked up: one gather a pixel instead of two, from a table of a quarter of
// the cache lines (a sixth less time for the five operations together than gathering from the
// ends).
template <bool kTone, bool kVibrance, bool kSaturate, bool kIncrease, class Tone>
struct ArithmeticColourVector {
  Tone tone;
  const FusedColourTables* t;

  HWY_INLINE VU operator()(VU raw) const {
    const DI di;
    const DF df;
    // The alpha byte goes from `raw` to the result unlooked-up.
    const VU p = kTone ? tone.Colours(raw) : raw;
    VI c[3];
    ColourChannels(p, c);
    VI mx = hn::Max(c[0], hn::Max(c[1], c[2]));
    VI mn = hn::Min(c[0], hn::Min(c[1], c[2]));
    VF gain;
    if (kSaturate && kIncrease) {
      gain = hn::GatherIndex(df, t->gains, hn::Or(hn::ShiftLeft<8>(mx), mn));
    } else {
      gain = hn::Set(df, t->fixedGain);
    }
    if (kVibrance) {
      VI luma;
      const VI k = SmallToInt(VibranceProduct(mx, mn, t->strength, &luma));
      const VI k16 = hn::And(k, hn::Set(di, 0xffff));
      for (VI& x : c) x = MixChannelShort(x, luma, k16);
      // Vibrance keeps the order of the channels (the plan makes sure of it), so the largest and
      // the smallest after it are those of the mixed channels.
      mx = hn::Max(c[0], hn::Max(c[1], c[2]));
      mn = hn::Min(c[0], hn::Min(c[1], c[2]));
    }
    if (kSaturate) {
      const VF lv = hn::Mul(hn::ConvertTo(df, hn::Add(mx, mn)), hn::Set(df, 0.5f));
      for (VI& x : c) {
        const VF f = hn::ConvertTo(df, x);
        const VF o = kIncrease ? hn::Add(f, hn::Mul(hn::Sub(f, lv), gain))
                               : hn::Add(lv, hn::Mul(hn::Sub(f, lv), gain));
        x = SmallToInt(kIncrease ? LimitAboveIncreasing(o) : LimitAbove(o));
      }
    }
    return PackLimited(raw, c[0], c[1], c[2]);
  }
};
#endif

// ---- Rows --------------------------------------------------------------------------------------

// Rows are walked in whole vectors of `d`'s lanes; the last partial vector goes through a
// zero-padded copy, so the tail gets the same arithmetic as every other pixel.
template <class D, class Kernel>
HWY_INLINE void ForEachVector(D d, uint8_t* pixels, size_t count, const Kernel& kernel) {
  using T = hn::TFromD<D>;
  const size_t step = hn::Lanes(d) * sizeof(T);
  const size_t bytes = count * 4;
  size_t i = 0;
  for (; i + step <= bytes; i += step) {
    T* const row = reinterpret_cast<T*>(pixels + i);
    hn::StoreU(kernel(hn::LoadU(d, row)), d, row);
  }
  if (i < bytes) {
    HWY_ALIGN T tail[HWY_MAX_BYTES / sizeof(T)] = {};
    std::memcpy(tail, pixels + i, bytes - i);
    hn::Store(kernel(hn::Load(d, tail)), d, tail);
    std::memcpy(pixels + i, tail, bytes - i);
  }
}

// ForEachVector from `src` to `dst`.
// How far ahead of the pixels it reads a row asks for its input: the hardware's own prefetch
// stops at every 4 KiB page, and in a chain of effects the frames come from memory, not cache.
// A source already in the first-level cache (kFromCache) is read without that hint.
constexpr size_t kPrefetchAhead = 4096;

template <bool kFromCache = false, class D, class Kernel>
HWY_INLINE void ForEachVectorInto(D d, uint8_t* dst, const uint8_t* src, size_t count,
                                  const Kernel& kernel) {
  using T = hn::TFromD<D>;
  const size_t step = hn::Lanes(d) * sizeof(T);
  const size_t bytes = count * 4;
  size_t i = 0;
  for (; i + step <= bytes; i += step) {
    if (!kFromCache) {
      // Only a hint, and past the row at its end: an integer, not a pointer beyond the array.
      hwy::Prefetch(
          reinterpret_cast<const uint8_t*>(reinterpret_cast<uintptr_t>(src) + i + kPrefetchAhead));
    }
    hn::StoreU(kernel(hn::LoadU(d, reinterpret_cast<const T*>(src + i))), d,
               reinterpret_cast<T*>(dst + i));
  }
  if (i < bytes) {
    HWY_ALIGN T tail[HWY_MAX_BYTES / sizeof(T)] = {};
    std::memcpy(tail, src + i, bytes - i);
    hn::Store(kernel(hn::Load(d, tail)), d, tail);
    std::memcpy(dst + i, tail, bytes - i);
  }
}

#if HWY_TARGET == HWY_SCALAR
// One-lane vectors have no byte shuffle to build on, so the table is read directly.
void ApplyTableRow(uint8_t* dst, const uint8_t* src, size_t count, const uint8_t table[256]) {
  for (size_t i = 0; i < count; ++i, dst += 4, src += 4) {
    dst[0] = table[src[0]];
    dst[1] = table[src[1]];
    dst[2] = table[src[2]];
    dst[3] = src[3];
  }
}
#else
void ApplyTableRow(uint8_t* dst, const uint8_t* src, size_t count, const uint8_t table[256]) {
  HWY_ALIGN uint8_t chunks[kChunkBytes];
  ForEachVectorInto(D8(), dst, src, count, MakeTableVector(table, chunks));
}
#endif

void VibranceRow(uint8_t* pixels, size_t count, float strength) {
  if (std::fabs(255.0f * strength) < 4194304.0f) {
    ForEachVector(DU(), pixels, count, VibranceVector<true>{strength});
  } else {
    ForEachVector(DU(), pixels, count, VibranceVector<false>{strength});
  }
}

void SaturationRow(uint8_t* pixels, size_t count, float sigma) {
  if (sigma >= 0.0f) {
    const float gain = 1.0f / (1.0f - sigma) - 1.0f;
    ForEachVector(DU(), pixels, count, SaturationVector<true, false>{sigma, gain});
  } else if (std::isfinite(sigma)) {
    ForEachVector(DU(), pixels, count, SaturationVector<false, false>{sigma, 1.0f + sigma});
  } else {
    ForEachVector(DU(), pixels, count, SaturationVector<false, true>{sigma, 1.0f + sigma});
  }
}

void ScaleChannelsRow(uint8_t* dst, const uint8_t* src, size_t count, const float gain[3]) {
#if HWY_TARGET == HWY_AVX3_DL
  // The products of every byte, limited as ScaleVector limits them (NaN gives 255).
  uint8_t tables[3][256];
  for (int i = 0; i < 3; ++i) {
    for (int v = 0; v < 256; ++v) {
      const float product = static_cast<float>(v) * gain[i];
      tables[i][v] = product < 0.0f     ? 0
                     : product < 255.0f ? static_cast<uint8_t>(static_cast<int>(product))
                                        : 255;
    }
  }
  ForEachVectorInto(
      DU(), dst, src, count,
      ScaleTablesVector{ByteTable(tables[0]), ByteTable(tables[1]), ByteTable(tables[2])});
#else
  ForEachVectorInto(DU(), dst, src, count, ScaleVector{gain[0], gain[1], gain[2]});
#endif
}

void BrightestTableRow(uint8_t* dst, const uint8_t* src, size_t count, const uint8_t* table) {
#if HWY_TARGET == HWY_AVX3_DL
  uint8_t diagonal[256];
  for (int m = 0; m < 256; ++m) diagonal[m] = table[m * 257];
  ForEachVectorInto(DU(), dst, src, count, BrightestPairVector{table, ByteTable(diagonal)});
#else
  ForEachVectorInto(DU(), dst, src, count, BrightestTableVector{table});
#endif
}

#if HWY_TARGET == HWY_SCALAR
struct ToneVector {
  const uint8_t* table;
  HWY_INLINE VU operator()(VU p) const {
    uint32_t v = hn::GetLane(p);
    v = (v & 0xff000000u) | table[v & 255u] | uint32_t{table[(v >> 8) & 255u]} << 8 |
        uint32_t{table[(v >> 16) & 255u]} << 16;
    return hn::Set(DU(), v);
  }
};
#else
struct ToneVector {
  TableVector bytes;
  HWY_INLINE VU operator()(VU p) const { return hn::BitCast(DU(), bytes(hn::BitCast(D8(), p))); }
  // Bytes 0..2 as operator() gives them; byte 3 is left to the caller.
  HWY_INLINE VU Colours(VU p) const {
    return hn::BitCast(DU(), bytes.Lookup(hn::BitCast(D8(), p)));
  }
};
#endif

// With AVX-512 the gathers of both ends cost less than working them out; with AVX2 (measured on
// AMD's Zen 3, whose second-level cache the ends table fills) vibrance alone took 1.8 times as
// long through them.
#if HWY_TARGET == HWY_SCALAR || (HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3)
template <bool kTone, bool kVibrance, bool kSaturate, bool kIncrease>
using Fused = FusedColourVector<kTone, kVibrance, kSaturate, kIncrease, ToneVector>;
constexpr bool kReadsEnds = true;
#else
template <bool kTone, bool kVibrance, bool kSaturate, bool kIncrease>
using Fused = ArithmeticColourVector<kTone, kVibrance, kSaturate, kIncrease, ToneVector>;
constexpr bool kReadsEnds = false;
#endif

// Below AVX-512, x86 has 16 vector registers, too few for the byte table's chunks and the colour
// arithmetic at once: the spills cost more than a second pass over pixels still in the first-level
// cache (on Zen 3, all five operations 1.17 times as fast with AVX2 and SSE4, 1.09 times with
// SSSE3). There the tone curve goes over a block of pixels first, and the rest follows over that
// block.
constexpr bool kToneFirst = TFX_X86_BELOW_AVX512;
constexpr size_t kToneBlock = 512;  // pixels: 2 KiB

void FusedColourRow(uint8_t* dst, const uint8_t* src, size_t count,
                    const FusedColourTables& tables) {
#if HWY_TARGET == HWY_SCALAR
  const ToneVector tone{tables.tone};
#else
  HWY_ALIGN uint8_t chunks[kChunkBytes] = {};
  const uint8_t identity[256] = {};  // never read: without a tone the kernels skip the lookup
  const ToneVector tone{MakeTableVector(tables.tone ? tables.tone : identity, chunks)};
#endif
  const bool vibrance = tables.strength != 0.0f;
  if (!vibrance && !tables.saturate) {
    if (tables.tone) {
      ForEachVectorInto(DU(), dst, src, count, tone);
    } else if (dst != src) {
      std::memcpy(dst, src, count * 4);
    }
    return;
  }
  // `cached_flag`: `from` is the toned block.
  const auto run = [&](auto tone_flag, auto vibrance_flag, auto cached_flag, uint8_t* to,
                       const uint8_t* from, size_t n) {
    constexpr bool kTone = decltype(tone_flag)::value;
    constexpr bool kVibrance = decltype(vibrance_flag)::value;
    constexpr bool kCached = decltype(cached_flag)::value;
    if (!tables.saturate) {
      ForEachVectorInto<kCached>(DU(), to, from, n,
                                 Fused<kTone, kVibrance, false, true>{tone, &tables});
    } else if (tables.increase) {
      ForEachVectorInto<kCached>(DU(), to, from, n,
                                 Fused<kTone, kVibrance, true, true>{tone, &tables});
    } else {
      ForEachVectorInto<kCached>(DU(), to, from, n,
                                 Fused<kTone, kVibrance, true, false>{tone, &tables});
    }
  };
  const auto with_tone = [&](auto vibrance_flag) {
    if (!tables.tone) {
      run(std::false_type(), vibrance_flag, std::false_type(), dst, src, count);
    } else if (!kToneFirst) {
      run(std::true_type(), vibrance_flag, std::false_type(), dst, src, count);
    } else {
      // In place too: a block is read whole before its pixels are written.
      HWY_ALIGN uint8_t toned[kToneBlock * 4];
      for (size_t done = 0; done < count; done += kToneBlock) {
        const size_t n = count - done < kToneBlock ? count - done : kToneBlock;
        ForEachVectorInto(DU(), toned, src + done * 4, n, tone);
        run(std::false_type(), vibrance_flag, std::true_type(), dst + done * 4, toned, n);
      }
    }
  };
  if (vibrance) {
    with_tone(std::true_type());
  } else {
    with_tone(std::false_type());
  }
}

const ColorAdjustRows* RowsOfThisTarget() {
  static const ColorAdjustRows rows = {
      hwy::TargetName(HWY_TARGET), &ApplyTableRow,     &VibranceRow,    &SaturationRow,
      &ScaleChannelsRow,           &BrightestTableRow, &FusedColourRow, kReadsEnds};
  return &rows;
}

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace tfx {

HWY_EXPORT(RowsOfThisTarget);

const ColorAdjustRows& BestColorAdjustRows() { return *HWY_DYNAMIC_DISPATCH(RowsOfThisTarget)(); }

}  // namespace tfx
#endif  // HWY_ONCE
