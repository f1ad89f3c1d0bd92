// The tetrahedral LUT row, compiled once per instruction set by foreach_target.h. One lane is one
// pixel.
//
// Every lane gives the bytes of TetraRowReference. The six cases of the reference differ only in
// which fraction comes first, second and third and in which two corners lie between C000 and
// C111, so each lane picks those (a selection is exact) and then evaluates the one expression
// every case shares, in the reference's order and precision:
//   ((1 - X) * C000 + (X - Y) * Ca) + (Y - Z) * Cb) + Z * C111
// Nothing is fused into a multiply-add: there is no MulAdd here, and the build passes
// -ffp-contract=off although the AVX2 and AVX-512 targets enable FMA instructions.
//
// A row goes through in blocks of pixels, in two passes. The first works out every pixel's
// weights and the offsets of its four corners and stores them; the second reads the corners and
// blends. Reading the offsets back from memory lets the corner loads go out independently of the
// arithmetic that made them (a compiler handed the offsets in a register pulls them out lane by
// lane through the shuffle port, which the transposes need too), and lets many of them wait on
// the cache at once. The first pass of the next block runs beside the second of this one: the
// first is arithmetic, the second waits on the corner loads and the shuffle port, and one after
// the other each left the other's units idle.
//
// Tables as doLUT builds them (each byte's position, lower index plus fraction, a quotient by one
// float) take two multiplies and an addition that the plan has checked against every byte, instead
// of the per-byte look-ups, which as gathers cost the most; a division gave the same bytes but kept
// the divider busy for 2-3% of a 64-point frame. Lattices too large for the cache go through
// whole bands sorted into slabs of red cells (TetraBandsVector).
#include <cstring>

#include "lut/CubeLutApply.h"
#include "simd/lut_tetra_rows.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/lut_tetra_rows_hwy.cpp"
#include <hwy/cache_control.h>
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

#include "simd/pixel_lanes-inl.h"

using MF = hn::Mask<DF>;

// Pixels per block: a multiple of every lane count. Prepared four vectors ahead of their blend,
// a 64-point lattice on random pixels took 3 to 4% less time than eight vectors ahead.
constexpr size_t kBlock = 64;

// One axis of a lane: its fraction and the step, in floats, from its lower to its upper point (the
// axis's stride: the packed lattice repeats its last plane, where the index is capped).
struct Axis {
  VF fraction;
  VI step;
};

HWY_INLINE Axis Pick(MF m, const Axis& yes, const Axis& no) {
  return {hn::IfThenElse(m, yes.fraction, no.fraction),
          hn::IfThenElse(hn::RebindMask(DI(), m), yes.step, no.step)};
}

// LutComponentToByte for every lane: trunc(min(v + 0.5, 255.0)) in double, NaN and values below
// the int32 range giving 0, and the low 8 bits kept. v + 0.5f in float would round (0.49999997f
// + 0.5f is 1), so the sum is never formed: with t = trunc(v) and f = v - t (both exact), the
// exact sum truncates to t + 1 when v >= 0 and f >= 0.5, or when v <= -1 and f > -0.5 (it is
// then negative and truncates upward), and to t otherwise (between -1 and 0 it lies within
// (-0.5, 0.5)).
//  - Above 254.5 the result is 255; clamping v to 254.5 first gives that too and bounds the rest.
//  - -2^31 is the last float whose double sum still truncates into int32.
HWY_INLINE VU ComponentBytes(VF v) {
  const DF df;
  const DI di;
  const DU du;
  const VF top = hn::Set(df, 254.5f);
  const VF c = hn::IfThenElse(hn::Gt(v, top), top, v);  // NaN stays NaN
  const MF in_range = hn::Ge(c, hn::Set(df, -2147483648.0f));
  const VF t = hn::Trunc(c);
  const VF f = hn::Sub(c, t);
  const MF up = hn::Or(hn::And(hn::Ge(c, hn::Zero(df)), hn::Ge(f, hn::Set(df, 0.5f))),
                       hn::And(hn::Le(c, hn::Set(df, -1.0f)), hn::Gt(f, hn::Set(df, -0.5f))));
  // Lanes out of range convert 0, so ConvertTo never sees NaN or an overflow.
  const VI i = hn::ConvertTo(di, hn::IfThenElseZero(in_range, t));
  const VI rounded = hn::Sub(i, hn::VecFromMask(di, hn::RebindMask(di, hn::And(in_range, up))));
  return hn::And(hn::BitCast(du, rounded), hn::Set(du, 255u));
}

// What a position lies above its lower lattice point (positions are never negative), exactly;
// the position less it is that point. AVX-512 has it in one instruction, where rounding down
// takes two on the same port: truncating, as x - x then gives +0 and not -0.
HWY_INLINE VF FractionOf(VF where) {
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
  return VF{_mm512_reduce_ps(where.raw, _MM_FROUND_TO_ZERO | _MM_FROUND_NO_EXC)};
#else
  return hn::Sub(where, hn::Floor(where));
#endif
}

// Pixels of a 64-byte line, and how far ahead of the first pass the pixels are prefetched.
constexpr size_t kLineLanes = 16;
constexpr size_t kAhead = 1024;

// A prefetch kPixels pixels on from `p`. Only a hint: the address may lie past the row or the
// slab, so it is made as an integer rather than by pointer arithmetic.
template <size_t kPixels = kAhead>
HWY_INLINE void PrefetchAhead(const uint32_t* p) {
  hwy::Prefetch(reinterpret_cast<const uint8_t*>(reinterpret_cast<uintptr_t>(p) + kPixels * 4));
}

// What the first pass leaves for the second, per pixel of a block.
struct Prepared {
  HWY_ALIGN float weight[4][kBlock];    // of C000, Ca, Cb, C111
  HWY_ALIGN int32_t corner[4][kBlock];  // offsets in floats of C000, Ca, Cb, C111
};

struct Kernel {
  const float* points;
  const float* ft;
  const float* position;  // or null
  float scale[2];         // or 0
  bool finite;            // every point and fraction
  const int32_t* lower[3];
  int32_t stride[3];
  // The same as floats, so that no lane conversion is repeated per vector.
  float strideF[3];

  // Tables as doLUT builds them: each byte's position a quotient, and every point finite.
  bool DoLutTables() const { return position && scale[0] != 0.0f && finite; }

  // The weights and corners of the pixels `p` (32-bit lanes, blue in the low byte) into lane
  // `at` onwards of `prepared`; kDoLut where DoLutTables() holds, which is then not tested again.
  template <bool kDoLut>
  HWY_INLINE void Prepare(VU p, Prepared& prepared, size_t at) const {
    const DI di;
    const DF df;
    const VI mask8 = hn::Set(di, 255);
    const VI pi = hn::BitCast(di, p);
    const VI b = hn::And(pi, mask8);
    const VI g = hn::And(hn::ShiftRight<8>(pi), mask8);
    const VI r = hn::And(hn::ShiftRight<16>(pi), mask8);

    Axis red, green, blue;
    VI p000;
    if (kDoLut || position) {
      // Gathers cost the most here: one a byte gives the lower index (its floor) and the
      // fraction (the rest). Index times stride and their sum stay far below 2^24, so float
      // arithmetic is exact.
      VF offset;
      const VI channel[3] = {r, g, b};
      Axis* const axes[3] = {&red, &green, &blue};
      for (int axis = 0; axis < 3; ++axis) {
        VF where;
        if (kDoLut || scale[0] != 0.0f) {
          const VF v = hn::ConvertTo(df, channel[axis]);
          where = hn::Add(hn::Mul(v, hn::Set(df, scale[0])), hn::Mul(v, hn::Set(df, scale[1])));
        } else {
          where = hn::GatherIndex(df, position, channel[axis]);
        }
        const VF fraction = FractionOf(where);
        const VF part = hn::Mul(hn::Sub(where, fraction), hn::Set(df, strideF[axis]));
        offset = axis == 0 ? part : hn::Add(offset, part);
        *axes[axis] = {fraction, hn::Set(di, stride[axis])};
      }
      p000 = SmallToInt(offset);  // below 2^22: at most 65^3 points of 4 floats
    } else {
      red = {hn::GatherIndex(df, ft, r), hn::Set(di, stride[0])};
      green = {hn::GatherIndex(df, ft, g), hn::Set(di, stride[1])};
      blue = {hn::GatherIndex(df, ft, b), hn::Set(di, stride[2])};
      p000 = hn::Add(hn::Add(hn::GatherIndex(di, lower[0], r), hn::GatherIndex(di, lower[1], g)),
                     hn::GatherIndex(di, lower[2], b));
    }

    const VF one = hn::Set(df, 1.0f);
    const VI p111 = hn::Add(p000, hn::Set(di, stride[0] + stride[1] + stride[2]));
    if (kDoLut || finite) {
      // Whichever of tied fractions the reference takes first, the fractions come out in
      // decreasing order, and a corner it would pass instead of the one here has weight 0, which
      // times a finite point adds nothing. So the sorted fractions, the axis of the largest and
      // that of the smallest give its bytes, at half the operations of its comparison chain.
      const VF low = hn::Min(red.fraction, green.fraction);
      const VF high = hn::Max(red.fraction, green.fraction);
      const VF first = hn::Max(high, blue.fraction);
      const VF second = hn::Max(low, hn::Min(high, blue.fraction));
      const VF third = hn::Min(low, blue.fraction);
      // Red wins ties for the largest and blue for the smallest, so the two axes always differ.
      const VI largest = hn::IfThenElse(
          hn::RebindMask(di, hn::Eq(red.fraction, first)), red.step,
          hn::IfThenElse(hn::RebindMask(di, hn::Eq(green.fraction, first)), green.step, blue.step));
      const VI smallest = hn::IfThenElse(
          hn::RebindMask(di, hn::Eq(blue.fraction, third)), blue.step,
          hn::IfThenElse(hn::RebindMask(di, hn::Eq(green.fraction, third)), green.step, red.step));
      hn::Store(hn::Sub(one, first), df, prepared.weight[0] + at);
      hn::Store(hn::Sub(first, second), df, prepared.weight[1] + at);
      hn::Store(hn::Sub(second, third), df, prepared.weight[2] + at);
      hn::Store(third, df, prepared.weight[3] + at);
      hn::Store(p000, di, prepared.corner[0] + at);
      hn::Store(hn::Add(p000, largest), di, prepared.corner[1] + at);
      hn::Store(hn::Sub(p111, smallest), di, prepared.corner[2] + at);
      hn::Store(p111, di, prepared.corner[3] + at);
      return;
    }

    // The reference's comparison chain, as masks.
    const MF rg = hn::Gt(red.fraction, green.fraction);
    const MF gb = hn::Gt(green.fraction, blue.fraction);
    const MF rb = hn::Gt(red.fraction, blue.fraction);
    const MF bg = hn::Gt(blue.fraction, green.fraction);
    const MF br = hn::Gt(blue.fraction, red.fraction);
    // fr > fg:  fg > fb: r g b;  else fr > fb: r b g;  else: b r g.
    // fr <= fg: fb > fg: b g r;  else fb > fr: g b r;  else: g r b.
    const Axis first = Pick(rg, Pick(hn::Or(gb, rb), red, blue), Pick(bg, blue, green));
    const Axis second =
        Pick(rg, Pick(gb, green, Pick(rb, blue, red)), Pick(bg, green, Pick(br, blue, red)));
    const VF third = hn::IfThenElse(rg, hn::IfThenElse(gb, blue.fraction, green.fraction),
                                    hn::IfThenElse(hn::Or(bg, br), red.fraction, blue.fraction));

    hn::Store(hn::Sub(one, first.fraction), df, prepared.weight[0] + at);
    hn::Store(hn::Sub(first.fraction, second.fraction), df, prepared.weight[1] + at);
    hn::Store(hn::Sub(second.fraction, third), df, prepared.weight[2] + at);
    hn::Store(third, df, prepared.weight[3] + at);

    const VI pa = hn::Add(p000, first.step);
    hn::Store(p000, di, prepared.corner[0] + at);
    hn::Store(pa, di, prepared.corner[1] + at);
    hn::Store(hn::Add(pa, second.step), di, prepared.corner[2] + at);
    hn::Store(p111, di, prepared.corner[3] + at);
  }
};

// ((w0 * c000 + w1 * ca) + w2 * cb) + w3 * c111, the reference's order.
HWY_INLINE VF Blend(const VF* w, VF c000, VF ca, VF cb, VF c111) {
  return hn::Add(hn::Add(hn::Add(hn::Mul(w[0], c000), hn::Mul(w[1], ca)), hn::Mul(w[2], cb)),
                 hn::Mul(w[3], c111));
}

struct Corner {
  VF red, green, blue;
};

#if HWY_TARGET == HWY_SCALAR

HWY_INLINE Corner LoadCorner(const float* points, const int32_t* offsets) {
  const DF df;
  const float* p = points + offsets[0];
  return {hn::Set(df, p[0]), hn::Set(df, p[1]), hn::Set(df, p[2])};
}

#else

// The points of pixels offsets[kSecond], offsets[kSecond + 4], ..., one per 128-bit block of `d`.
// Offsets are read in pairs, one 64-bit load for the pixels 4m and 4m + 1 (or 4m + 2 and
// 4m + 3) that two of LoadCorner's vectors share: with a load an offset, a 64-point lattice on
// random pixels took 4 to 7% longer.
template <int kSecond, class D>
HWY_INLINE hn::Vec<D> LoadBlocks(D d, const float* points, const int32_t* offsets) {
  if constexpr (hn::MaxLanes(D()) <= 4) {
    uint64_t pair;
    std::memcpy(&pair, offsets, sizeof pair);
    constexpr bool kLittle = __BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__;
    const int shift = (kSecond == 1) == kLittle ? 32 : 0;
    return hn::LoadU(d, points + static_cast<uint32_t>(pair >> shift));
  } else {
    const hn::Half<D> dh;
    const hn::Vec<decltype(dh)> lower = LoadBlocks<kSecond>(dh, points, offsets);
    const hn::Vec<decltype(dh)> upper = LoadBlocks<kSecond>(dh, points, offsets + hn::Lanes(dh));
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
    if constexpr (hn::MaxLanes(D()) == 16) {
      // Combine zero-extends the lower half first, which GCC emits as one more move for every
      // four corners, on the ports the transposes need.
      return hn::Vec<D>{_mm512_insertf32x8(_mm512_castps256_ps512(lower.raw), upper.raw, 1)};
    }
#endif
    return hn::Combine(d, upper, lower);
  }
}

// Each point is read as four floats from its red: red, green, blue, and a 0 or the next point's
// red, which the transposes drop; four vectors of them are transposed into red, green and blue
// vectors.
HWY_INLINE Corner LoadCorner(const float* points, const int32_t* offsets) {
  const DF df;
  // Block m of a_q is the point of pixel 4m + q, so the transpose inside each 128-bit block puts
  // every pixel's values in its own lane.
  const VF a0 = LoadBlocks<0>(df, points, offsets), a1 = LoadBlocks<1>(df, points, offsets);
  const VF a2 = LoadBlocks<0>(df, points, offsets + 2), a3 = LoadBlocks<1>(df, points, offsets + 2);
  Corner c;
  TransposeBlocks(a0, a1, a2, a3, c.red, c.green, c.blue);
  return c;
}

#endif  // HWY_TARGET == HWY_SCALAR

// Whether every lane of r, g and b is at least `least` (NaN is not), each comparison masked by
// the one before rather than the masks joined after.
HWY_INLINE bool AllAtLeast(VF r, VF g, VF b, float least) {
  const DF df;
  const VF bound = hn::Set(df, least);
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
  __mmask16 k = _mm512_cmp_ps_mask(r.raw, bound.raw, _CMP_GE_OQ);
  k = _mm512_mask_cmp_ps_mask(k, g.raw, bound.raw, _CMP_GE_OQ);
  k = _mm512_mask_cmp_ps_mask(k, b.raw, bound.raw, _CMP_GE_OQ);
  return k == 0xFFFF;
#else
  return hn::AllTrue(df, hn::And(hn::Ge(r, bound), hn::And(hn::Ge(g, bound), hn::Ge(b, bound))));
#endif
}

// Lattices stay within 0..255 in practice, and their blends convert by ShortBytes wherever Short
// holds for every channel; ComponentBytes is for the others. ShortBytes is the truncation of
// min(v, 254.5) + 0.5 in float.
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
// With the sum rounded toward zero, its truncation is that of the exact sum for every v from 0 up
// (NaN is not), so one comparison a channel admits them all (a keyer's colours, many of them 0,
// passed neither of the two tests below and went through both).
HWY_INLINE bool Short(VF r, VF g, VF b) { return AllAtLeast(r, g, b, 0.0f); }
#else
// Rounded to nearest, the sum crosses an integer from 0 up only for the largest float below 0.5
// (it rounds to 1). Above 0.5 the sum has at most one more bit than v, and lies less than 0.5
// above a power of two it crossed, so a rounding never reaches the next integer. Values from 0.5
// up (NaN fails the comparison) pass at half the comparisons of the full test.
HWY_INLINE bool Short(VF r, VF g, VF b) {
  const DF df;
  const auto plain = [&](VF v) {
    return hn::And(hn::Ge(v, hn::Zero(df)), hn::Ne(v, hn::Set(df, 0.49999997f)));
  };
  return AllAtLeast(r, g, b, 0.5f) ||
         hn::AllTrue(df, hn::And(plain(r), hn::And(plain(g), plain(b))));
}
#endif

HWY_INLINE VU ShortBytes(VF v) {
  const DF df;
  const VF c = hn::Min(v, hn::Set(df, 254.5f));
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
  const VF sum{
      _mm512_add_round_ps(c.raw, hn::Set(df, 0.5f).raw, _MM_FROUND_TO_ZERO | _MM_FROUND_NO_EXC)};
#else
  const VF sum = hn::Add(c, hn::Set(df, 0.5f));
#endif
  return hn::BitCast(DU(), SmallToInt(sum));
}

// The second pass for one vector of pixels `p` whose first pass is at lane `at` of `prepared`.
template <bool kGrey>
HWY_INLINE VU Finish(const Kernel& kernel, VU p, const Prepared& prepared, size_t at) {
  const DU du;
  const DI di;
  const DF df;
  const VF w[4] = {hn::Load(df, prepared.weight[0] + at), hn::Load(df, prepared.weight[1] + at),
                   hn::Load(df, prepared.weight[2] + at), hn::Load(df, prepared.weight[3] + at)};
  const VU alpha = hn::And(p, hn::Set(du, 0xff000000u));
  if constexpr (kGrey) {
    // One float a point; the byte goes to blue, green and red alike.
    VF c[4];
    for (int k = 0; k < 4; ++k) {
      c[k] = hn::GatherIndex(df, kernel.points, hn::Load(di, prepared.corner[k] + at));
    }
    const VF v = Blend(w, c[0], c[1], c[2], c[3]);
    const VU v8 = Short(v, v, v) ? ShortBytes(v) : ComponentBytes(v);
    return hn::Or(alpha, hn::Or(hn::Or(v8, hn::ShiftLeft<8>(v8)), hn::ShiftLeft<16>(v8)));
  } else {
    Corner c[4];
    // Written out: as a loop the compiler kept the corners on the stack, a store and a load each.
    c[0] = LoadCorner(kernel.points, prepared.corner[0] + at);
    c[1] = LoadCorner(kernel.points, prepared.corner[1] + at);
    c[2] = LoadCorner(kernel.points, prepared.corner[2] + at);
    c[3] = LoadCorner(kernel.points, prepared.corner[3] + at);
    const VF r = Blend(w, c[0].red, c[1].red, c[2].red, c[3].red);
    const VF g = Blend(w, c[0].green, c[1].green, c[2].green, c[3].green);
    const VF b = Blend(w, c[0].blue, c[1].blue, c[2].blue, c[3].blue);
    VU r8, g8, b8;
    if (Short(r, g, b)) {
      r8 = ShortBytes(r), g8 = ShortBytes(g), b8 = ShortBytes(b);
    } else {
      r8 = ComponentBytes(r), g8 = ComponentBytes(g), b8 = ComponentBytes(b);
    }
    // Red to byte 2, green to byte 1, blue to byte 0, alpha kept.
    return hn::Or(hn::Or3(b8, hn::ShiftLeft<8>(g8), hn::ShiftLeft<16>(r8)), alpha);
  }
}

// The first pass over `count` pixels. The kernel comes by value: read through a reference, its
// values were loaded again after every store to `prepared`, which might have changed them.
template <bool kDoLut>
HWY_INLINE void PrepareBlock(const Kernel kernel, const uint32_t* in, Prepared& prepared,
                             size_t count) {
  const DU du;
  const size_t lanes = hn::Lanes(du);
  for (size_t x = 0; x < count; x += lanes) {
    // The hardware's own prefetch fell behind: the first load of a block waited on memory for a
    // sixth of the time.
    for (size_t line = 0; line < lanes; line += kLineLanes) PrefetchAhead(in + x + line);
    kernel.Prepare<kDoLut>(hn::LoadU(du, in + x), prepared, x);
  }
}

// `whole` 4-byte pixels (a whole number of vectors) in blocks, each vector of the next block
// prepared beside one of this block being finished.
template <bool kGrey, bool kDirect, bool kDoLut>
HWY_INLINE void Blocks(const Kernel kernel, const uint32_t* in, uint32_t* out, size_t whole) {
  const DU du;
  const size_t lanes = hn::Lanes(du);
  Prepared prepared[2];
  // In place, a block's results go through the stack first: stored straight over the row, on
  // frames whose neighbouring pixels share corners (so that the corner loads finish early), they
  // held up the next block's pixel loads, and a photo-like frame took 40% longer than random
  // pixels.
  const bool stage = in == out && !kDirect;
  PrepareBlock<kDoLut>(kernel, in, prepared[0], whole < kBlock ? whole : kBlock);
  size_t now = 0;
  for (size_t start = 0; start < whole; start += kBlock, now ^= 1) {
    const size_t count = whole - start < kBlock ? whole - start : kBlock;
    const size_t next = start + count;
    const size_t nextCount = whole - next < kBlock ? whole - next : kBlock;
    HWY_ALIGN uint32_t staged[kBlock];
    uint32_t* const to = stage ? staged : out + start;
    for (size_t x = 0; x < count; x += lanes) {
      if (x < nextCount) {
        for (size_t line = 0; line < lanes; line += kLineLanes) PrefetchAhead(in + next + x + line);
        kernel.Prepare<kDoLut>(hn::LoadU(du, in + next + x), prepared[now ^ 1], x);
      }
      hn::StoreU(Finish<kGrey>(kernel, hn::LoadU(du, in + start + x), prepared[now], x), du,
                 to + x);
    }
    if (stage) std::memcpy(out + start, staged, count * 4);
  }
}

// Blocks, with the kernel's tables tested once. kDirect: in place without staging, for pixels
// whose corners are scattered (the slabs) and for buffers of the kernel's own.
template <bool kGrey, bool kDirect>
HWY_INLINE void Vectors(const Kernel& kernel, const uint32_t* in, uint32_t* out, size_t whole) {
  if (whole == 0) return;
  if (kernel.DoLutTables()) {
    Blocks<kGrey, kDirect, true>(kernel, in, out, whole);
  } else {
    Blocks<kGrey, kDirect, false>(kernel, in, out, whole);
  }
}

// 4-byte pixels in whole blocks and vectors; the last partial vector goes through a zero-padded
// copy, so the tail gets the same arithmetic as every other pixel.
template <bool kGrey, bool kDirect = false>
void Rows4(const Kernel& kernel, const uint8_t* in, uint8_t* out, size_t width) {
  const DU du;
  const size_t lanes = hn::Lanes(du);
  const size_t whole = width / lanes * lanes;
  // Rows only reaches here with both rows 4-byte aligned; odd ones go through RowsN.
  Vectors<kGrey, kDirect>(kernel, reinterpret_cast<const uint32_t*>(in),
                          reinterpret_cast<uint32_t*>(out), whole);
  if (whole < width) {
    HWY_ALIGN uint32_t tail[HWY_MAX_BYTES / sizeof(uint32_t)] = {};
    std::memcpy(tail, in + 4 * whole, (width - whole) * 4);
    Vectors<kGrey, true>(kernel, tail, tail, lanes);
    std::memcpy(out + 4 * whole, tail, (width - whole) * 4);
  }
}

// Other pixel sizes gather blue, green and red into 4-byte pixels a block at a time; bytes past
// the third are copied through.
template <bool kGrey>
void RowsN(const Kernel& kernel, const uint8_t* in, uint8_t* out, size_t width,
           size_t bytesPerPixel) {
  const DU du;
  const size_t lanes = hn::Lanes(du);
  HWY_ALIGN uint32_t block[kBlock];
  if (in != out) std::memcpy(out, in, width * bytesPerPixel);
  for (size_t start = 0; start < width; start += kBlock) {
    const size_t count = width - start < kBlock ? width - start : kBlock;
    uint8_t* const first = out + start * bytesPerPixel;
    const uint8_t* p = first;
    for (size_t i = 0; i < count; ++i, p += bytesPerPixel) {
      block[i] = uint32_t{p[0]} | uint32_t{p[1]} << 8 | uint32_t{p[2]} << 16;
    }
    const size_t padded = (count + lanes - 1) / lanes * lanes;
    for (size_t i = count; i < padded; ++i) block[i] = 0;
    Vectors<kGrey, true>(kernel, block, block, padded);
    uint8_t* q = first;
    for (size_t i = 0; i < count; ++i, q += bytesPerPixel) {
      q[0] = static_cast<uint8_t>(block[i]);
      q[1] = static_cast<uint8_t>(block[i] >> 8);
      q[2] = static_cast<uint8_t>(block[i] >> 16);
    }
  }
}

template <bool kGrey>
void Rows(const Kernel& kernel, const uint8_t* in, uint8_t* out, int width, int bytesPerPixel) {
  if (bytesPerPixel == 4 && reinterpret_cast<uintptr_t>(in) % 4 == 0 &&
      reinterpret_cast<uintptr_t>(out) % 4 == 0) {
    Rows4<kGrey>(kernel, in, out, static_cast<size_t>(width));
  } else {
    RowsN<kGrey>(kernel, in, out, static_cast<size_t>(width), static_cast<size_t>(bytesPerPixel));
  }
}

Kernel MakeKernel(const TetraPlan& plan) {
  return {plan.Points(),
          plan.Fractions(),
          plan.Positions(),
          {plan.Scale(0), plan.Scale(1)},
          plan.Finite(),
          {plan.Lower(0), plan.Lower(1), plan.Lower(2)},
          {plan.Stride(0), plan.Stride(1), plan.Stride(2)},
          {static_cast<float>(plan.Stride(0)), static_cast<float>(plan.Stride(1)),
           static_cast<float>(plan.Stride(2))}};
}

void TetraRowOfTarget(const TetraPlan& plan, const uint8_t* in, uint8_t* out, int width,
                      int bytesPerPixel) {
  if (width <= 0) return;
  const Kernel kernel = MakeKernel(plan);
  if (plan.Grey()) {
    Rows<true>(kernel, in, out, width, bytesPerPixel);
  } else {
    Rows<false>(kernel, in, out, width, bytesPerPixel);
  }
}

constexpr int kSlabs = TetraPlan::kMaxSlabs;
using MU = hn::Mask<DU>;

// The slabs of a band: which slab each pixel's red byte falls in, the slab's pixels in the order
// they were met, and how far each slab has been filled or read back.
struct Slabs {
  // How far ahead of the sort and of the put-back each slab's pixels are asked for: each slab
  // fills or drains at about a quarter of the walk's pace, and the hardware's prefetch, following
  // the frame and every slab at once, fell behind (together with the counts kept in registers,
  // below, a 64-point frame of random pixels 1.025 times as fast, faster in 14 of 14 rounds).
  static constexpr size_t kSlabAhead = 256;
  int32_t start[kSlabs];
  uint32_t* pixels[kSlabs];
  size_t count[kSlabs];
  // From one image to another, each vector's lanes of every slab as the sort met them, so that
  // putting the results back reads neither the input nor its red bytes again. In place they are
  // not kept: the put-back finds them again in the red bytes of the line it is about to write,
  // which it reads from memory anyway (about 2% of a 64-point frame of random pixels).
  uint8_t* bits;
  uint8_t* firstBits;
  static constexpr size_t kMaskBytes = (HWY_MAX_BYTES / sizeof(uint32_t) + 7) / 8;

  // Back to the first vector's masks, for the pass that reads what the last one wrote.
  void Rewind() { bits = firstBits; }

  // Which lanes of `p` fall in each slab: those whose red byte reaches the slab's start and not
  // the next one's.
  HWY_INLINE void Masks(VU p, MU in[kSlabs]) const {
    const DI di;
    const VI r = hn::And(hn::BitCast(di, hn::ShiftRight<16>(p)), hn::Set(di, 255));
    MU reaches[kSlabs];
    for (int k = 1; k < kSlabs; ++k) {
      reaches[k] = hn::RebindMask(DU(), hn::Gt(r, hn::Set(di, start[k] - 1)));
    }
    in[0] = hn::Not(reaches[1]);
    for (int k = 1; k + 1 < kSlabs; ++k) in[k] = hn::AndNot(reaches[k + 1], reaches[k]);
    in[kSlabs - 1] = reaches[kSlabs - 1];
  }

  template <bool kKeepMasks>
  HWY_INLINE void Sort(VU p) {
    const DU du;
    MU in[kSlabs];
    Masks(p, in);
    for (int k = 0; k < kSlabs; ++k) {
      const MU m = in[k];
      if (kKeepMasks) {
        hn::StoreMaskBits(du, m, bits);
        bits += kMaskBytes;
      }
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
      // The register form and a whole store: the memory form is several times slower on Intel
      // cores, and every slab has a vector to spare past its end.
      PrefetchAhead<kSlabAhead>(pixels[k] + count[k]);
      hn::StoreU(VU{_mm512_maskz_compress_epi32(m.raw, p.raw)}, du, pixels[k] + count[k]);
      count[k] += hn::CountTrue(du, m);
#else
      count[k] += hn::CompressStore(p, m, du, pixels[k] + count[k]);
#endif
    }
  }

  // The next lanes of every slab, each to where its pixel came from: by the kept masks, or
  // those of the pixels `p` the results replace.
  template <bool kKeptMasks>
  HWY_INLINE VU Gather(VU p) {
    const DU du;
    MU in[kSlabs];
    if (!kKeptMasks) Masks(p, in);
    VU result = hn::Zero(du);
    for (int k = 0; k < kSlabs; ++k) {
      if (kKeptMasks) {
        in[k] = hn::LoadMaskBits(du, bits);
        bits += kMaskBytes;
      }
      PrefetchAhead<kSlabAhead>(pixels[k] + count[k]);
      result = hn::Or(result, ExpandLoad(in[k], pixels[k] + count[k]));
      count[k] += hn::CountTrue(du, in[k]);
    }
    return result;
  }

  // Consecutive values from `from` into the lanes of `m`, zero elsewhere.
  static HWY_INLINE VU ExpandLoad(MU m, const uint32_t* from) {
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
    return VU{_mm512_maskz_expand_epi32(m.raw, hn::LoadU(DU(), from).raw)};
#else
    const DU du;
    HWY_ALIGN uint32_t lanes[HWY_MAX_BYTES / sizeof(uint32_t)];
    HWY_ALIGN uint32_t take[HWY_MAX_BYTES / sizeof(uint32_t)];
    hn::Store(hn::VecFromMask(du, m), du, take);
    for (size_t i = 0, j = 0; i < hn::Lanes(du); ++i) lanes[i] = take[i] ? from[j++] : 0;
    return hn::Load(du, lanes);
#endif
  }
};

// Rows of one band of the image.
struct Band {
  const uint8_t* in;
  ptrdiff_t inPitch;
  uint8_t* out;
  ptrdiff_t pitch;
  int rows;
};

// One walk that sorts the pixels of `sort` into `sorting` and puts those of `put` back from
// `putting`; either band may be null. Both passes mostly wait on memory, and one beside the
// other they wait together (a 64-point frame of random pixels took 2-4% less than with a walk
// each). `put` is the band before `sort`, so neither touches the other's rows. Every row goes in
// whole vectors, and its last partial vector through a zero-padded copy, in both passes alike,
// so both meet the same pixels in the same order. kInPlace: `put` writes over its input.
template <bool kInPlace>
HWY_INLINE void SortAndPutBack(const Band* sort, Slabs& sortingOut, const Band* put,
                               Slabs& puttingOut, size_t width) {
  // On copies, whose counts stay in registers: kept in the caller's slabs, each count went to
  // memory after every vector and its next update waited on that store (a 64-point frame of
  // random pixels 1.014 times as fast).
  Slabs sorting = sortingOut, putting = puttingOut;
  const DU du;
  const size_t lanes = hn::Lanes(du);
  const size_t whole = width / lanes * lanes;
  const int sortRows = sort ? sort->rows : 0, putRows = put ? put->rows : 0;
  for (int y = 0; y < sortRows || y < putRows; ++y) {
    const uint32_t* from =
        y < sortRows ? reinterpret_cast<const uint32_t*>(sort->in + y * sort->inPitch) : nullptr;
    uint32_t* to = y < putRows ? reinterpret_cast<uint32_t*>(put->out + y * put->pitch) : nullptr;
    for (size_t x = 0; x < whole; x += lanes) {
      if (from) {
        PrefetchAhead(from + x);
        sorting.Sort<!kInPlace>(hn::LoadU(du, from + x));
      }
      if (to) {
        PrefetchAhead(to + x);
        const VU before = kInPlace ? hn::LoadU(du, to + x) : hn::Zero(du);
        hn::StoreU(putting.Gather<!kInPlace>(before), du, to + x);
      }
    }
    if (whole < width) {
      HWY_ALIGN uint32_t tail[HWY_MAX_BYTES / sizeof(uint32_t)] = {};
      if (from) {
        std::memcpy(tail, from + whole, (width - whole) * 4);
        sorting.Sort<!kInPlace>(hn::Load(du, tail));
      }
      if (to) {
        if (kInPlace) {
          hn::Store(hn::Zero(du), du, tail);
          std::memcpy(tail, to + whole, (width - whole) * 4);
        }
        hn::Store(putting.Gather<!kInPlace>(hn::Load(du, tail)), du, tail);
        std::memcpy(to + whole, tail, (width - whole) * 4);
      }
    }
  }
  sortingOut = sorting;
  puttingOut = putting;
}

// The bands through the slabs, on the instruction sets that sort.
template <bool kInPlace>
void Bands(const TetraPlan& plan, const uint8_t* in, ptrdiff_t inPitch, uint8_t* out,
           ptrdiff_t pitch, int width, int rows, int bandRows, uint32_t* scratch) {
  const Kernel kernel = MakeKernel(plan);
  const size_t w = static_cast<size_t>(width);
  const size_t capacity = TetraBandCapacity(width, bandRows);
  // Two bands' slabs, each half of the scratch: one band's results are put back while the next
  // band is sorted.
  Slabs slabs[2];
  for (int b = 0; b < 2; ++b) {
    uint32_t* const base = scratch + b * (TetraBandScratch(width, bandRows) / 2);
    for (int k = 0; k < kSlabs; ++k) {
      slabs[b].start[k] = plan.SlabStart(k);
      slabs[b].pixels[k] = base + k * capacity;
      slabs[b].count[k] = 0;
    }
    slabs[b].bits = slabs[b].firstBits = reinterpret_cast<uint8_t*>(base + kSlabs * capacity);
  }
  const auto band = [&](int y) {
    return Band{in + y * inPitch, inPitch, out + y * pitch, pitch,
                rows - y < bandRows ? rows - y : bandRows};
  };
  Band now = band(0);
  SortAndPutBack<kInPlace>(&now, slabs[0], nullptr, slabs[1], w);
  slabs[0].Rewind();
  for (int y = 0, b = 0; y < rows; y += bandRows, b ^= 1) {
    Slabs& mine = slabs[b];
    for (int k = 0; k < kSlabs; ++k) {
      uint8_t* const pixels = reinterpret_cast<uint8_t*>(mine.pixels[k]);
      Rows4<false, true>(kernel, pixels, pixels, mine.count[k]);
      mine.count[k] = 0;
    }
    const bool more = y + bandRows < rows;
    const Band next = more ? band(y + bandRows) : Band{};
    SortAndPutBack<kInPlace>(more ? &next : nullptr, slabs[b ^ 1], &now, mine, w);
    // The sorted band keeps its counts for its interpolation; this one starts afresh.
    slabs[b ^ 1].Rewind();
    mine.Rewind();
    for (int k = 0; k < kSlabs; ++k) mine.count[k] = 0;
    now = next;
  }
}

void TetraBandsOfTarget(const TetraPlan& plan, const uint8_t* in, ptrdiff_t inPitch, uint8_t* out,
                        ptrdiff_t pitch, int width, int rows, int bandRows, uint32_t* scratch) {
  if (width <= 0 || rows <= 0 || bandRows <= 0) return;
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
  constexpr bool kSort = true;
  static_assert(HWY_MAX_BYTES == kSortBytes, "the band's sizes assume these vectors");
#else
  constexpr bool kSort = false;
#endif
  if (!kSort) {
    // Without a compress and an expand instruction, sorting into slabs and back costs more than
    // the cache misses it saves: a 64-point lattice on random pixels took three times as long
    // with AVX2 as the plain rows, and still 1.04 to 1.85 times as long with both done by a
    // permute from a table of lane orders (four slabs of 17 planes, or eight of 9, which fit
    // Zen 3's second-level cache).
    const Kernel kernel = MakeKernel(plan);
    for (int y = 0; y < rows; ++y) {
      Rows4<false>(kernel, in + y * inPitch, out + y * pitch, static_cast<size_t>(width));
    }
    return;
  }
  if (in == out && inPitch == pitch) {
    Bands<true>(plan, in, inPitch, out, pitch, width, rows, bandRows, scratch);
  } else {
    Bands<false>(plan, in, inPitch, out, pitch, width, rows, bandRows, scratch);
  }
}

int PointFloatsOfThisTarget() {
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
  return 4;
#else
  return 3;
#endif
}

const char* TargetOfThisTarget() { return hwy::TargetName(HWY_TARGET); }

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {

HWY_EXPORT(TetraRowOfTarget);
HWY_EXPORT(TetraBandsOfTarget);
HWY_EXPORT(TargetOfThisTarget);
HWY_EXPORT(PointFloatsOfThisTarget);

int TetraPointFloats() { return HWY_DYNAMIC_DISPATCH(PointFloatsOfThisTarget)(); }

// Here, after every target, HWY_MAX_BYTES is the last target's (the scalar one's 8 bytes), so
// sizes that must hold any target's vectors take the widest, which only sort into slabs.
constexpr size_t kSortLanes = kSortBytes / sizeof(uint32_t);

size_t TetraBandCapacity(int width, int rows) {
  // Whole vectors of every row, and one more that the compressing store may write past the last.
  const size_t padded = (static_cast<size_t>(width) + kSortLanes - 1) / kSortLanes * kSortLanes;
  return padded * static_cast<size_t>(rows) + kSortLanes;
}

size_t TetraBandScratch(int width, int rows) {
  // The slabs, then every vector's mask of each slab's lanes, in bytes rounded up to whole lines;
  // twice over.
  const size_t vectors =
      (static_cast<size_t>(width) + kSortLanes - 1) / kSortLanes * static_cast<size_t>(rows);
  const size_t maskBytes = vectors * TetraPlan::kMaxSlabs * ((kSortLanes + 7) / 8);
  const size_t band = TetraPlan::kMaxSlabs * TetraBandCapacity(width, rows) + (maskBytes + 3) / 4;
  return 2 * ((band + kSortLanes - 1) / kSortLanes * kSortLanes);
}

void TetraBandsVector(const TetraPlan& plan, const uint8_t* in, ptrdiff_t inPitch, uint8_t* out,
                      ptrdiff_t pitch, int width, int rows, int bandRows, uint32_t* scratch) {
  HWY_DYNAMIC_DISPATCH(TetraBandsOfTarget)
  (plan, in, inPitch, out, pitch, width, rows, bandRows, scratch);
}

void TetraRowVector(const TetraPlan& plan, const uint8_t* in, uint8_t* out, int width,
                    int bytesPerPixel) {
  HWY_DYNAMIC_DISPATCH(TetraRowOfTarget)(plan, in, out, width, bytesPerPixel);
}

const char* TetraRowVectorTarget() { return HWY_DYNAMIC_DISPATCH(TargetOfThisTarget)(); }

}  // namespace tfx
#endif  // HWY_ONCE
