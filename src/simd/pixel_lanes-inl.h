// Packed 4-byte pixels as 32-bit lanes, for the Highway kernels. Included inside a kernel file's
// HWY_NAMESPACE (or a namespace within it), once per target, after
// `namespace hn = hwy::HWY_NAMESPACE;`.

// The x86 targets below AVX-512, evaluated anew for each target a kernel file is compiled for: 16
// vector registers, and truncation that takes out-of-range values to INT_MIN.
#ifndef TFX_X86_BELOW_AVX512
#define TFX_X86_BELOW_AVX512 \
  (HWY_ARCH_X86 && (HWY_TARGET == HWY_AVX2 || HWY_TARGET == HWY_SSE4 || HWY_TARGET == HWY_SSSE3))
#endif

using DU = hn::ScalableTag<uint32_t>;
using DI = hn::RebindToSigned<DU>;
using DF = hn::RebindToFloat<DU>;
using VU = hn::Vec<DU>;
using VI = hn::Vec<DI>;
using VF = hn::Vec<DF>;

// The byte at bit `shift` (0, 8 or 16) of each pixel.
HWY_INLINE VI ChannelAt(VU p, int shift) {
  const VU shifted = shift == 0 ? p : shift == 8 ? hn::ShiftRight<8>(p) : hn::ShiftRight<16>(p);
  return hn::BitCast(DI(), hn::And(shifted, hn::Set(DU(), 255u)));
}

// trunc(v) for |v| < 2^22. ConvertTo would add an overflow fix-up these values never need: x86
// converts them directly; elsewhere, plus 1.5 * 2^23 the value is exact and holds the integer in
// its low mantissa bits.
HWY_INLINE VI SmallToInt(VF v) {
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
  return VI{_mm512_cvttps_epi32(v.raw)};
#elif HWY_ARCH_X86 && HWY_TARGET == HWY_AVX2
  return VI{_mm256_cvttps_epi32(v.raw)};
#elif HWY_ARCH_X86 && (HWY_TARGET == HWY_SSE4 || HWY_TARGET == HWY_SSSE3)
  return VI{_mm_cvttps_epi32(v.raw)};
#else
  const VF shifted = hn::Add(hn::Trunc(v), hn::Set(DF(), 12582912.0f));
  return hn::Sub(hn::BitCast(DI(), shifted), hn::Set(DI(), 0x4b400000));
#endif
}

#if HWY_TARGET != HWY_SCALAR
// Four vectors whose 128-bit block m holds, in a_q, the four floats of the item of lane 4m + q
// (as separate loads of 16 bytes fill them); the items' first, second and third floats come out
// one vector each, in lane order. A transpose inside each block; the fourth floats are dropped.
HWY_INLINE void TransposeBlocks(VF a0, VF a1, VF a2, VF a3, VF& first, VF& second, VF& third) {
  const DF df;
  const hn::Repartition<double, DF> dd;
  const auto t0 = hn::BitCast(dd, hn::InterleaveLower(df, a0, a1));  // x0 x1 y0 y1
  const auto t1 = hn::BitCast(dd, hn::InterleaveUpper(df, a0, a1));  // z0 z1 w0 w1
  const auto t2 = hn::BitCast(dd, hn::InterleaveLower(df, a2, a3));  // x2 x3 y2 y3
  const auto t3 = hn::BitCast(dd, hn::InterleaveUpper(df, a2, a3));  // z2 z3 w2 w3
  first = hn::BitCast(df, hn::InterleaveLower(dd, t0, t2));
  second = hn::BitCast(df, hn::InterleaveUpper(dd, t0, t2));
  third = hn::BitCast(df, hn::InterleaveLower(dd, t1, t3));
}
#endif
