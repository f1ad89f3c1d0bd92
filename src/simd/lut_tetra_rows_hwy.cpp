// The tetrahedral LUT row, compiled once per instruction set by foreach_target.h. One lane is one
// pixel.
//
// Every lane gives the bytes of TetraRowReference. The six cases of the reference differ only in
// which fraction comes first, second and third and in which two corners lie between C000 and
// C111, so each lane picks those (a selection is exact) and then evaluates the one expression
// every case shares, in the reference's order and precision:
//   ((1 - X) * C000 + (X - Y) * Ca) + (Y - Z) * Cb) + Z * C111
// Each corner point is read as one unaligned block of four floats (its red, green and blue and
// the next point's red), and four such blocks are transposed into red, green and blue vectors:
// four loads per pixel instead of twelve gathered floats. Nothing is fused into a
// multiply-add: there is no MulAdd here, and the build passes -ffp-contract=off although the
// AVX2 and AVX-512 targets enable FMA instructions.
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

using DU = hn::ScalableTag<uint32_t>;
using DI = hn::RebindToSigned<DU>;
using DF = hn::RebindToFloat<DU>;
using VU = hn::Vec<DU>;
using VI = hn::Vec<DI>;
using VF = hn::Vec<DF>;
using MF = hn::Mask<DF>;

// One axis of a lane: its fraction and the step, in lattice points, from its lower to its upper
// index (0 where the upper index is capped).
struct Axis {
  VF fraction;
  VI step;
};

HWY_INLINE Axis Pick(MF m, const Axis& yes, const Axis& no) {
  return {hn::IfThenElse(m, yes.fraction, no.fraction),
          hn::IfThenElse(hn::RebindMask(DI(), m), yes.step, no.step)};
}

// x * 3, the lattice offset in floats of point number x.
HWY_INLINE VI Times3(VI x) { return hn::Add(hn::ShiftLeft<1>(x), x); }

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

// The offset, in floats, of the lattice's last point: only N = 64 reaches it, and its block of
// four floats would end one float past the lattice.
constexpr int32_t kLastPoint = 64 * 64 * 64 * 3 - 3;

struct Corner {
  VF red, green, blue;
};

#if HWY_TARGET == HWY_SCALAR

template <bool kReachesEnd>
HWY_INLINE Corner LoadCorner(const float* lattice, VI offsets) {
  const DF df;
  return {hn::GatherIndex(df, lattice, offsets), hn::GatherIndex(df, lattice + 1, offsets),
          hn::GatherIndex(df, lattice + 2, offsets)};
}

#else

// The blocks of pixels offsets[0], offsets[4], offsets[8], ..., one per 128-bit block of `d`.
template <class D>
HWY_INLINE hn::Vec<D> LoadBlocks(D d, const float* lattice, const int32_t* offsets) {
  if constexpr (hn::MaxLanes(D()) <= 4) {
    return hn::LoadU(d, lattice + offsets[0]);
  } else {
    const hn::Half<D> dh;
    return hn::Combine(d, LoadBlocks(dh, lattice, offsets + hn::Lanes(dh)),
                       LoadBlocks(dh, lattice, offsets));
  }
}

// kReachesEnd: the lattice is 64 points per axis, and a lane on the last point reads its block
// one float early and takes floats 1..3 of it.
template <bool kReachesEnd>
HWY_INLINE Corner LoadCorner(const float* lattice, VI offsets) {
  const DF df;
  const DI di;
  const hn::Repartition<double, DF> dd;
  const VI early = hn::Set(di, kLastPoint - 1);
  const auto last = hn::Gt(offsets, early);
  HWY_ALIGN int32_t at[HWY_MAX_BYTES / sizeof(int32_t)];
  hn::Store(kReachesEnd ? hn::Min(offsets, early) : offsets, di, at);
  // Block m of a_q is the point of pixel 4m + q, so the transpose inside each 128-bit block puts
  // every pixel's values in its own lane.
  const VF a0 = LoadBlocks(df, lattice, at), a1 = LoadBlocks(df, lattice, at + 1);
  const VF a2 = LoadBlocks(df, lattice, at + 2), a3 = LoadBlocks(df, lattice, at + 3);
  const auto t0 = hn::BitCast(dd, hn::InterleaveLower(df, a0, a1));  // r0 r1 g0 g1
  const auto t1 = hn::BitCast(dd, hn::InterleaveUpper(df, a0, a1));  // b0 b1 x0 x1
  const auto t2 = hn::BitCast(dd, hn::InterleaveLower(df, a2, a3));  // r2 r3 g2 g3
  const auto t3 = hn::BitCast(dd, hn::InterleaveUpper(df, a2, a3));  // b2 b3 x2 x3
  const VF x0 = hn::BitCast(df, hn::InterleaveLower(dd, t0, t2));
  const VF x1 = hn::BitCast(df, hn::InterleaveUpper(dd, t0, t2));
  const VF x2 = hn::BitCast(df, hn::InterleaveLower(dd, t1, t3));
  if (!kReachesEnd) return {x0, x1, x2};
  const VF x3 = hn::BitCast(df, hn::InterleaveUpper(dd, t1, t3));
  const MF shifted = hn::RebindMask(df, last);
  return {hn::IfThenElse(shifted, x1, x0), hn::IfThenElse(shifted, x2, x1),
          hn::IfThenElse(shifted, x3, x2)};
}

#endif  // HWY_TARGET == HWY_SCALAR

// ((w0 * c000 + w1 * ca) + w2 * cb) + w3 * c111, the reference's order.
HWY_INLINE VF Blend(VF w0, VF c000, VF w1, VF ca, VF w2, VF cb, VF w3, VF c111) {
  return hn::Add(hn::Add(hn::Add(hn::Mul(w0, c000), hn::Mul(w1, ca)), hn::Mul(w2, cb)),
                 hn::Mul(w3, c111));
}

template <bool kReachesEnd>
struct TetraKernel {
  const float* lattice;
  const float* ft;
  const int32_t* gt;
  int32_t last;

  // Pixels as 32-bit lanes, blue in the low byte; byte 3 passes through.
  HWY_INLINE VU operator()(VU p) const {
    const DU du;
    const DI di;
    const DF df;
    const VI mask8 = hn::Set(di, 255);
    const VI pi = hn::BitCast(di, p);
    const VI b = hn::And(pi, mask8);
    const VI g = hn::And(hn::ShiftRight<8>(pi), mask8);
    const VI r = hn::And(hn::ShiftRight<16>(pi), mask8);

    const VI ri = hn::GatherIndex(di, gt, r);
    const VI gi = hn::GatherIndex(di, gt, g);
    const VI bi = hn::GatherIndex(di, gt, b);
    const VI last_v = hn::Set(di, last);
    const VI one = hn::Set(di, 1);
    // Points along red, green and blue are 64 * 64, 64 and 1 apart.
    const Axis red{hn::GatherIndex(df, ft, r),
                   hn::ShiftLeft<12>(hn::Sub(hn::Min(hn::Add(ri, one), last_v), ri))};
    const Axis green{hn::GatherIndex(df, ft, g),
                     hn::ShiftLeft<6>(hn::Sub(hn::Min(hn::Add(gi, one), last_v), gi))};
    const Axis blue{hn::GatherIndex(df, ft, b), hn::Sub(hn::Min(hn::Add(bi, one), last_v), bi)};

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

    const VF w0 = hn::Sub(hn::Set(df, 1.0f), first.fraction);
    const VF w1 = hn::Sub(first.fraction, second.fraction);
    const VF w2 = hn::Sub(second.fraction, third);
    const VF w3 = third;

    const VI p000 = hn::Add(hn::Add(hn::ShiftLeft<12>(ri), hn::ShiftLeft<6>(gi)), bi);
    const VI pa = hn::Add(p000, first.step);
    const VI pb = hn::Add(pa, second.step);
    const VI p111 = hn::Add(hn::Add(hn::Add(p000, red.step), green.step), blue.step);
    const Corner c000 = LoadCorner<kReachesEnd>(lattice, Times3(p000));
    const Corner ca = LoadCorner<kReachesEnd>(lattice, Times3(pa));
    const Corner cb = LoadCorner<kReachesEnd>(lattice, Times3(pb));
    const Corner c111 = LoadCorner<kReachesEnd>(lattice, Times3(p111));

    const VU r8 = ComponentBytes(Blend(w0, c000.red, w1, ca.red, w2, cb.red, w3, c111.red));
    const VU g8 = ComponentBytes(Blend(w0, c000.green, w1, ca.green, w2, cb.green, w3, c111.green));
    const VU b8 = ComponentBytes(Blend(w0, c000.blue, w1, ca.blue, w2, cb.blue, w3, c111.blue));
    // Red to byte 2, green to byte 1, blue to byte 0.
    const VU alpha = hn::And(p, hn::Set(du, 0xff000000u));
    return hn::Or(hn::Or(alpha, b8), hn::Or(hn::ShiftLeft<8>(g8), hn::ShiftLeft<16>(r8)));
  }
};

// How far ahead of the vector being computed the corners of pixels are prefetched, in pixels.
constexpr size_t kPrefetchAhead = 32;

// Starts loading the four lattice rows that hold the corners of `count` 4-byte pixels. A lattice
// of more than about 40 points per axis outgrows a 1 MiB second-level cache, and with pixels in
// no particular order the corner loads then wait on memory; prefetching a few vectors ahead lets
// those waits overlap.
template <class Kernel>
HWY_INLINE void PrefetchCorners(const Kernel& kernel, const uint8_t* pixels, size_t count) {
  for (size_t i = 0; i < count; ++i, pixels += 4) {
    const int32_t ri = kernel.gt[pixels[2]], gi = kernel.gt[pixels[1]], bi = kernel.gt[pixels[0]];
    const int32_t rn = ri + 1 < kernel.last ? ri + 1 : kernel.last;
    const int32_t gn = gi + 1 < kernel.last ? gi + 1 : kernel.last;
    for (const int32_t r : {ri, rn}) {
      for (const int32_t g : {gi, gn}) {
        hwy::Prefetch(kernel.lattice + ((r << 12) + (g << 6) + bi) * 3);
      }
    }
  }
}

// `count` 4-byte pixels in place, a whole number of vectors.
template <bool kPrefetch, class Kernel>
HWY_INLINE void WholeVectors(const Kernel& kernel, uint8_t* pixels, size_t count) {
  const DU du;
  const size_t lanes = hn::Lanes(du);
  for (size_t x = 0; x < count; x += lanes) {
    if (kPrefetch && x + kPrefetchAhead + lanes <= count) {
      PrefetchCorners(kernel, pixels + 4 * (x + kPrefetchAhead), lanes);
    }
    uint32_t* const p = reinterpret_cast<uint32_t*>(pixels + 4 * x);
    hn::StoreU(kernel(hn::LoadU(du, p)), du, p);
  }
}

// 4-byte pixels in place, in whole vectors; the last partial vector goes through a zero-padded
// copy, so the tail gets the same arithmetic as every other pixel.
template <bool kPrefetch, class Kernel>
void Rows4(const Kernel& kernel, uint8_t* row, size_t width) {
  const DU du;
  const size_t lanes = hn::Lanes(du);
  const size_t whole = width / lanes * lanes;
  WholeVectors<kPrefetch>(kernel, row, whole);
  if (whole < width) {
    HWY_ALIGN uint32_t tail[HWY_MAX_BYTES / sizeof(uint32_t)] = {};
    std::memcpy(tail, row + 4 * whole, (width - whole) * 4);
    hn::Store(kernel(hn::Load(du, tail)), du, tail);
    std::memcpy(row + 4 * whole, tail, (width - whole) * 4);
  }
}

// Other pixel sizes gather blue, green and red into 4-byte pixels a block at a time.
template <bool kPrefetch, class Kernel>
void RowsN(const Kernel& kernel, uint8_t* row, size_t width, size_t bytesPerPixel) {
  const DU du;
  const size_t lanes = hn::Lanes(du);
  constexpr size_t kBlock = 256;  // a multiple of any lane count
  HWY_ALIGN uint32_t block[kBlock];
  for (size_t start = 0; start < width; start += kBlock) {
    const size_t count = width - start < kBlock ? width - start : kBlock;
    uint8_t* const first = row + start * bytesPerPixel;
    const uint8_t* in = first;
    for (size_t i = 0; i < count; ++i, in += bytesPerPixel) {
      block[i] = uint32_t{in[0]} | uint32_t{in[1]} << 8 | uint32_t{in[2]} << 16;
    }
    const size_t padded = (count + lanes - 1) / lanes * lanes;
    for (size_t i = count; i < padded; ++i) block[i] = 0;
    WholeVectors<kPrefetch>(kernel, reinterpret_cast<uint8_t*>(block), padded);
    uint8_t* out = first;
    for (size_t i = 0; i < count; ++i, out += bytesPerPixel) {
      out[0] = static_cast<uint8_t>(block[i]);
      out[1] = static_cast<uint8_t>(block[i] >> 8);
      out[2] = static_cast<uint8_t>(block[i] >> 16);
    }
  }
}

template <bool kPrefetch, class Kernel>
void Rows(const Kernel& kernel, uint8_t* row, int width, int bytesPerPixel) {
  if (bytesPerPixel == 4) {
    Rows4<kPrefetch>(kernel, row, static_cast<size_t>(width));
  } else {
    RowsN<kPrefetch>(kernel, row, static_cast<size_t>(width), static_cast<size_t>(bytesPerPixel));
  }
}

void TetraRowOfTarget(const TetraTable& table, uint8_t* row, int width, int bytesPerPixel) {
  if (width <= 0) return;
  if (table.size == 64) {
    Rows<true>(TetraKernel<true>{table.lattice, table.ft, table.gt, 63}, row, width, bytesPerPixel);
    return;
  }
  const TetraKernel<false> kernel{table.lattice, table.ft, table.gt, table.size - 1};
  if (table.size > 40) {
    Rows<true>(kernel, row, width, bytesPerPixel);
  } else {
    Rows<false>(kernel, row, width, bytesPerPixel);
  }
}

const char* TargetOfThisTarget() { return hwy::TargetName(HWY_TARGET); }

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {

HWY_EXPORT(TetraRowOfTarget);
HWY_EXPORT(TargetOfThisTarget);

void TetraRowVector(const TetraTable& table, uint8_t* row, int width, int bytesPerPixel) {
  HWY_DYNAMIC_DISPATCH(TetraRowOfTarget)(table, row, width, bytesPerPixel);
}

const char* TetraRowVectorTarget() { return HWY_DYNAMIC_DISPATCH(TargetOfThisTarget)(); }

}  // namespace tfx
#endif  // HWY_ONCE
