// The 8-point DCT kernels, compiled once per instruction set by foreach_target.h.
//
// Every transform is one of the two butterflies below (the textbook even/odd one for the exported
// transforms, a scaled one for the denoiser), evaluated lane by lane in the order written,
// in single precision, with nothing fused into a multiply-add (there is no MulAdd here, and the
// build passes -ffp-contract=off although the AVX2 and AVX-512 targets enable FMA). A lane's
// result therefore never depends on how many lanes a vector has.
#include <algorithm>
#include <cmath>
#include <cstring>
#include <new>

#include "simd/dct8.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/dct8_hwy.cpp"
#include <hwy/cache_control.h>
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

namespace {

// c(k) cos(k pi / 16): 1/2 cos for k >= 1, sqrt(1/8) for the DC term and k = 4.
constexpr float kC1 = 0.4903926f;
constexpr float kC2 = 0.4619398f;
constexpr float kC3 = 0.4157348f;
constexpr float kC4 = 0.3535534f;
constexpr float kC5 = 0.2777851f;
constexpr float kC6 = 0.1913417f;
constexpr float kC7 = 0.0975452f;

// The DCT-II of x[0..7] into X[0..7]. Sums and differences of mirrored samples split the even
// outputs from the odd ones, halving the multiplies of the textbook matrix.
template <class D, class V = hn::Vec<D>>
HWY_INLINE void Forward(D d, const V* x, V* X) {
  const V c1 = hn::Set(d, kC1), c2 = hn::Set(d, kC2), c3 = hn::Set(d, kC3);
  const V c4 = hn::Set(d, kC4), c5 = hn::Set(d, kC5), c6 = hn::Set(d, kC6);
  const V c7 = hn::Set(d, kC7);
  const V s07 = hn::Add(x[0], x[7]), s16 = hn::Add(x[1], x[6]);
  const V s25 = hn::Add(x[2], x[5]), s34 = hn::Add(x[3], x[4]);
  const V d07 = hn::Sub(x[0], x[7]), d16 = hn::Sub(x[1], x[6]);
  const V d25 = hn::Sub(x[2], x[5]), d34 = hn::Sub(x[3], x[4]);
  const V e0 = hn::Add(s07, s34), e1 = hn::Add(s16, s25);
  const V e2 = hn::Sub(s07, s34), e3 = hn::Sub(s16, s25);
  X[0] = hn::Mul(c4, hn::Add(e0, e1));
  X[4] = hn::Mul(c4, hn::Sub(e0, e1));
  X[2] = hn::Add(hn::Mul(c2, e2), hn::Mul(c6, e3));
  X[6] = hn::Sub(hn::Mul(c6, e2), hn::Mul(c2, e3));
  X[1] = hn::Add(hn::Add(hn::Add(hn::Mul(c1, d07), hn::Mul(c3, d16)), hn::Mul(c5, d25)),
                 hn::Mul(c7, d34));
  X[3] = hn::Sub(hn::Sub(hn::Sub(hn::Mul(c3, d07), hn::Mul(c7, d16)), hn::Mul(c1, d25)),
                 hn::Mul(c5, d34));
  X[5] = hn::Add(hn::Add(hn::Sub(hn::Mul(c5, d07), hn::Mul(c1, d16)), hn::Mul(c7, d25)),
                 hn::Mul(c3, d34));
  X[7] = hn::Sub(hn::Add(hn::Sub(hn::Mul(c7, d07), hn::Mul(c5, d16)), hn::Mul(c3, d25)),
                 hn::Mul(c1, d34));
}

// The last stage of both inverses: x[i] = e_i + o_i and x[7 - i] = e_i - o_i.
template <class V>
HWY_INLINE void Recombine(V e0, V e1, V e2, V e3, V o0, V o1, V o2, V o3, V* x) {
  x[0] = hn::Add(e0, o0);
  x[7] = hn::Sub(e0, o0);
  x[1] = hn::Add(e1, o1);
  x[6] = hn::Sub(e1, o1);
  x[2] = hn::Add(e2, o2);
  x[5] = hn::Sub(e2, o2);
  x[3] = hn::Add(e3, o3);
  x[4] = hn::Sub(e3, o3);
}

// The DCT-III (the transpose) of X[0..7] into x[0..7]. The odd 4 x 4 block of the matrix is
// symmetric, so the odd half uses the same products as Forward.
template <class D, class V = hn::Vec<D>>
HWY_INLINE void Inverse(D d, const V* X, V* x) {
  const V c1 = hn::Set(d, kC1), c2 = hn::Set(d, kC2), c3 = hn::Set(d, kC3);
  const V c4 = hn::Set(d, kC4), c5 = hn::Set(d, kC5), c6 = hn::Set(d, kC6);
  const V c7 = hn::Set(d, kC7);
  const V p0 = hn::Mul(c4, hn::Add(X[0], X[4])), p1 = hn::Mul(c4, hn::Sub(X[0], X[4]));
  const V q0 = hn::Add(hn::Mul(c2, X[2]), hn::Mul(c6, X[6]));
  const V q1 = hn::Sub(hn::Mul(c6, X[2]), hn::Mul(c2, X[6]));
  const V e0 = hn::Add(p0, q0), e3 = hn::Sub(p0, q0);
  const V e1 = hn::Add(p1, q1), e2 = hn::Sub(p1, q1);
  const V o0 = hn::Add(hn::Add(hn::Add(hn::Mul(c1, X[1]), hn::Mul(c3, X[3])), hn::Mul(c5, X[5])),
                       hn::Mul(c7, X[7]));
  const V o1 = hn::Sub(hn::Sub(hn::Sub(hn::Mul(c3, X[1]), hn::Mul(c7, X[3])), hn::Mul(c1, X[5])),
                       hn::Mul(c5, X[7]));
  const V o2 = hn::Add(hn::Add(hn::Sub(hn::Mul(c5, X[1]), hn::Mul(c1, X[3])), hn::Mul(c7, X[5])),
                       hn::Mul(c3, X[7]));
  const V o3 = hn::Sub(hn::Add(hn::Sub(hn::Mul(c7, X[1]), hn::Mul(c5, X[3])), hn::Mul(c3, X[5])),
                       hn::Mul(c1, X[7]));
  Recombine(e0, e1, e2, e3, o0, o1, o2, o3, x);
}

// Arai, Agui and Nakajima's factorisation, which the denoiser runs: 5 multiplies where the
// butterfly above takes 22 (on Zen 3 the denoiser took 1.17 times as long with that one). Output
// k of the forward form is DctForwardGain(k) times the orthonormal one, and the inverse form
// takes input k at 8 / DctForwardGain(k) times. The gains are left in: those of a block's
// coefficients go into its thresholds, and a block comes back 64 times its size (8 per
// dimension), a power of 2 that the final division takes out exactly.
template <class D, class V = hn::Vec<D>>
HWY_INLINE void ForwardScaled(D d, const V* x, V* X) {
  const V t0 = hn::Add(x[0], x[7]), t7 = hn::Sub(x[0], x[7]);
  const V t1 = hn::Add(x[1], x[6]), t6 = hn::Sub(x[1], x[6]);
  const V t2 = hn::Add(x[2], x[5]), t5 = hn::Sub(x[2], x[5]);
  const V t3 = hn::Add(x[3], x[4]), t4 = hn::Sub(x[3], x[4]);
  const V e0 = hn::Add(t0, t3), e3 = hn::Sub(t0, t3);
  const V e1 = hn::Add(t1, t2), e2 = hn::Sub(t1, t2);
  X[0] = hn::Add(e0, e1);
  X[4] = hn::Sub(e0, e1);
  const V z1 = hn::Mul(hn::Add(e2, e3), hn::Set(d, 0.707106781f));
  X[2] = hn::Add(e3, z1);
  X[6] = hn::Sub(e3, z1);
  const V o0 = hn::Add(t4, t5), o1 = hn::Add(t5, t6), o2 = hn::Add(t6, t7);
  const V z5 = hn::Mul(hn::Sub(o0, o2), hn::Set(d, 0.382683433f));
  const V z2 = hn::Add(hn::Mul(hn::Set(d, 0.541196100f), o0), z5);
  const V z4 = hn::Add(hn::Mul(hn::Set(d, 1.306562965f), o2), z5);
  const V z3 = hn::Mul(o1, hn::Set(d, 0.707106781f));
  const V z11 = hn::Add(t7, z3), z13 = hn::Sub(t7, z3);
  X[5] = hn::Add(z13, z2);
  X[3] = hn::Sub(z13, z2);
  X[1] = hn::Add(z11, z4);
  X[7] = hn::Sub(z11, z4);
}

template <class D, class V = hn::Vec<D>>
HWY_INLINE void InverseScaled(D d, const V* X, V* x) {
  const V sqrt2 = hn::Set(d, 1.414213562f);
  const V p0 = hn::Add(X[0], X[4]), p1 = hn::Sub(X[0], X[4]);
  const V q0 = hn::Add(X[2], X[6]);
  const V q1 = hn::Sub(hn::Mul(hn::Sub(X[2], X[6]), sqrt2), q0);
  const V e0 = hn::Add(p0, q0), e3 = hn::Sub(p0, q0);
  const V e1 = hn::Add(p1, q1), e2 = hn::Sub(p1, q1);
  const V z13 = hn::Add(X[5], X[3]), z10 = hn::Sub(X[5], X[3]);
  const V z11 = hn::Add(X[1], X[7]), z12 = hn::Sub(X[1], X[7]);
  const V o0 = hn::Add(z11, z13);
  const V o11 = hn::Mul(hn::Sub(z11, z13), sqrt2);
  const V z5 = hn::Mul(hn::Add(z10, z12), hn::Set(d, 1.847759065f));
  // The negated odd terms of the published form, which negation leaves exact.
  const V o10 = hn::Sub(z5, hn::Mul(z12, hn::Set(d, 1.082392200f)));
  const V o12 = hn::Sub(z5, hn::Mul(z10, hn::Set(d, 2.613125930f)));
  const V o1 = hn::Sub(o12, o0);
  const V o2 = hn::Sub(o11, o1);
  const V o3 = hn::Sub(o10, o2);
  Recombine(e0, e1, e2, e3, o0, o1, o2, o3, x);
}

template <bool kScaled = false, class D, class V = hn::Vec<D>>
HWY_INLINE void Transform(D d, const V* in, V* out, bool inverse) {
  if (kScaled && inverse) {
    InverseScaled(d, in, out);
  } else if (kScaled) {
    ForwardScaled(d, in, out);
  } else if (inverse) {
    Inverse(d, in, out);
  } else {
    Forward(d, in, out);
  }
}

// The 1-D transform down each column of a row-major block; every column is read before its
// results are stored, so `out` may be `in`.
void Columns(const float* in, float* out, bool inverse) {
  const hn::CappedTag<float, 8> d;
  using V = hn::Vec<decltype(d)>;
  for (size_t column = 0; column < 8; column += hn::Lanes(d)) {
    V x[8], X[8];
    for (size_t row = 0; row < 8; ++row) x[row] = hn::LoadU(d, in + row * 8 + column);
    Transform(d, x, X, inverse);
    for (size_t row = 0; row < 8; ++row) hn::StoreU(X[row], d, out + row * 8 + column);
  }
}

void Transpose(const float* in, float* out) {
  for (int i = 0; i < 8; ++i) {
    for (int j = 0; j < 8; ++j) out[j * 8 + i] = in[i * 8 + j];
  }
}

// ---- The sliding denoiser --------------------------------------------------------------------
//
// Block (x, y) covers columns x..x+7 and rows y..y+7. Its 2-D transform is the row transform of
// its 8 rows, then the column transform; the inverse is the reverse. Two facts make the sliding
// window cheap:
//  - Every block of one x shares the row transforms of columns x..x+7, so the transform of each
//    pixel row at x is done once, not once per block.
//  - The inverse row transform is linear and the same for every block of that x, so each block
//    only undoes its column transform; the rows of all blocks over a pixel row are summed, still
//    in the row-frequency domain, and the inverse row transform runs once per pixel row and x.
// The float additions keep one order on every target: row p of block column x sums row p - y of
// blocks y = p - 7 .. p in increasing y, and pixel (c, p) adds the inverse row transforms of
// block columns x = c - 7 .. c to zero in increasing x.
//
// Vectors run along a row, one lane per block column, and the plane is walked down in tiles of
// kTileBlocks block columns, so that a tile's rolling state (the row transforms of 8 rows and the
// block-row sums of 8 rows) stays in the first-level cache. The last 7 pixels a tile reaches
// also take blocks of the next tile: their sums so far are carried, one set per row, and the
// next tile adds its terms to them. A tile writes only pixels left of its last block column and
// reads only from its first block column on; the 7 columns past its last block column are
// written by the tile to its right, a row at least 9 steps after this tile read it, and tiles
// take each band of rows from left to right. So the output may overwrite the source.
//
// The weight of a pixel is the number of blocks covering it, (min(y, 7) + 1) * (min(x, 7) + 1)
// for every pixel the output takes from the blocks; it is formed exactly instead of counted.

using DF = hn::ScalableTag<float>;
using VF = hn::Vec<DF>;

// Enough for aligned loads of the widest vector.
constexpr size_t kAlignment = 64;

// Block columns per tile, a multiple of every vector length.
constexpr size_t kTileBlocks = 64;
// Where block column `first` of a tile row of terms starts: past 7 zeros, on a vector boundary.
constexpr size_t kLead = 16;
// A tile row with the columns before and after its blocks, and the widest vector past them.
constexpr size_t kRowFloats = kTileBlocks + 48;
// Pixels whose sums pass from one tile to the next.
constexpr size_t kCarried = 7;
// Floats of one tile's state.
constexpr size_t kTileFloats = 128 * kTileBlocks + 22 * kRowFloats;
// Tiles walked side by side, a band of block rows at a time: the rows of a band are then read by
// one tile after another while their pages are still in the translation cache, where a tile
// walking the whole height would look up every row's page anew. A group's states take a few
// MiB.
constexpr size_t kGroupTiles = 64;
constexpr size_t kBandRows = 128;

size_t RoundUp(size_t n, size_t step) { return (n + step - 1) / step * step; }

struct Scratch {
  float* transforms;  // row r's transform at (r % 8 * 8 + k) * kTileBlocks, frequency k
  float* sums;        // row r's block-row sums, laid out as the transforms
  // Two of each, for consecutive rows: a row's floats are stored one step before they are read
  // at other offsets, since a load that straddles stores still in flight waits for them.
  float* terms[2];  // term j of block column x at j * kRowFloats + x - first + kLead, zeros around
  float* samples[2];  // a row's samples from column `first`
  float* partial;     // sums carried into the tile's first 7 pixels, zeros after
  float* totals;      // the sums of one row's pixels, from column `first`
  float* columnWeight;
  uint8_t* bytes;
  float* carried;  // kCarried per block row; null with a single tile, whose partial sums are 0
};

// One 8-bit plane, samples `step` bytes apart along a row.
struct Plane {
  const uint8_t* src;
  uint8_t* dst;
  ptrdiff_t stride;
  size_t step;
  size_t channel;  // the byte of a 4-byte step the samples are
};

// 4-byte pixels go through 32-bit lanes, the plane's byte being bits 8 channel up (x86 and
// every other target here are little-endian).
#if HWY_TARGET != HWY_SCALAR
using DU = hn::RebindToUnsigned<DF>;
using DPixelBytes = hn::Repartition<uint8_t, DU>;
#endif

// A tile reads a few bytes of each row, far apart: the rows it reads next are fetched ahead.
constexpr ptrdiff_t kPrefetchRows = 6;

void LoadSamples(const Plane& plane, size_t row, size_t rows, size_t first, size_t count,
                 float* out) {
  const uint8_t* p = plane.src + static_cast<ptrdiff_t>(row) * plane.stride + first * plane.step;
  if (row + kPrefetchRows < rows) {
    const uint8_t* ahead = p + kPrefetchRows * plane.stride;
    for (size_t i = 0; i < count * plane.step; i += 64) hwy::Prefetch(ahead + i);
    hwy::Prefetch(ahead + (count - 1) * plane.step);
  }
  size_t i = 0;
  const DF d;
  const hn::RebindToSigned<DF> di;
  if (plane.step == 1) {
    const hn::Rebind<uint8_t, DF> d8;
    for (; i + hn::Lanes(d) <= count; i += hn::Lanes(d)) {
      hn::Store(hn::ConvertTo(d, hn::PromoteTo(di, hn::LoadU(d8, p + i))), d, out + i);
    }
  }
#if HWY_TARGET != HWY_SCALAR
  if (plane.step == 4) {
    const DU du;
    const DPixelBytes d8;
    const auto low = hn::Set(du, 0xFF);
    const int shift = static_cast<int>(8 * plane.channel);
    for (; i + hn::Lanes(d) <= count; i += hn::Lanes(d)) {
      const auto pixels = hn::BitCast(du, hn::LoadU(d8, p - plane.channel + 4 * i));
      const auto samples = hn::And(hn::ShiftRightSame(pixels, shift), low);
      hn::Store(hn::ConvertTo(d, hn::BitCast(di, samples)), d, out + i);
    }
  }
#endif
  for (; i < count; ++i) out[i] = p[i * plane.step];
}

// The forward row transform of `samples` into transform slot `slot`.
void RowTransforms(const Scratch& s, const float* samples, size_t slot, size_t tile) {
  const DF d;
  float* out = s.transforms + slot * 8 * kTileBlocks;
  for (size_t x = 0; x < tile; x += hn::Lanes(d)) {
    VF in[8], X[8];
    for (size_t n = 0; n < 8; ++n) in[n] = hn::LoadU(d, samples + x + n);
    ForwardScaled(d, in, X);
    for (size_t k = 0; k < 8; ++k) hn::Store(X[k], d, out + k * kTileBlocks + x);
  }
}

// Block row y: column transform, threshold, inverse column transform; row i of each block
// starts the sums of row y + 7 and is added to those of rows y..y+6. `thresholds` holds the
// threshold of column frequency j and row frequency k at 8 k + j.
void Blocks(const Scratch& s, size_t y, size_t tile, const float* thresholds) {
  const DF d;
  const float* rows[8];
  float* sums[8];
  for (size_t i = 0; i < 8; ++i) {
    rows[i] = s.transforms + (y + i) % 8 * 8 * kTileBlocks;
    sums[i] = s.sums + (y + i) % 8 * 8 * kTileBlocks;
  }
  for (size_t k = 0; k < 8 * kTileBlocks; k += kTileBlocks) {
    VF t[8];
    for (size_t j = 0; j < 8; ++j) t[j] = hn::Set(d, thresholds[k / kTileBlocks * 8 + j]);
    for (size_t x = 0; x < tile; x += hn::Lanes(d)) {
      VF in[8], coefficients[8], out[8];
      for (size_t i = 0; i < 8; ++i) in[i] = hn::Load(d, rows[i] + k + x);
      ForwardScaled(d, in, coefficients);
      for (size_t j = 0; j < 8; ++j) {
        coefficients[j] =
            hn::IfThenZeroElse(hn::Lt(hn::Abs(coefficients[j]), t[j]), coefficients[j]);
      }
      InverseScaled(d, coefficients, out);
      hn::Store(out[7], d, sums[7] + k + x);
      for (size_t i = 0; i < 7; ++i) {
        hn::Store(hn::Add(hn::Load(d, sums[i] + k + x), out[i]), d, sums[i] + k + x);
      }
    }
  }
}

// The inverse row transform of row y's sums, term j of block column x going to pixel x + j.
void InverseRows(const Scratch& s, size_t y, size_t tile) {
  float* terms = s.terms[y % 2];
  const DF d;
  const float* sums = s.sums + y % 8 * 8 * kTileBlocks;
  for (size_t x = 0; x < tile; x += hn::Lanes(d)) {
    VF in[8], out[8];
    for (size_t k = 0; k < 8; ++k) in[k] = hn::Load(d, sums + k * kTileBlocks + x);
    InverseScaled(d, in, out);
    for (size_t j = 0; j < 8; ++j) hn::Store(out[j], d, terms + j * kRowFloats + kLead + x);
  }
  // Lanes past the tile's blocks: no block there.
  for (size_t j = 0; j < 8; ++j) {
    std::fill(terms + j * kRowFloats + kLead + tile,
              terms + j * kRowFloats + kLead + RoundUp(tile, hn::Lanes(d)), 0.0f);
  }
}

// Row y's pixels from `first` on: the carried sums plus the terms of the tile's block columns,
// then the average, truncated into 0..255, for the tile's own pixels.
void FinishRow(const Scratch& s, size_t y, size_t tile) {
  const float* terms = s.terms[y % 2];
  const DF d;
  const hn::RebindToSigned<DF> di;
  const hn::Rebind<uint8_t, DF> d8;
  const VF rowWeight = hn::Set(d, static_cast<float>(std::min<size_t>(y, 7) + 1));
  const VF zero = hn::Zero(d), top = hn::Set(d, 255.0f);
  for (size_t u = 0; u < tile + kCarried; u += hn::Lanes(d)) {
    VF sum = hn::Load(d, s.partial + u);
    for (size_t j = 8; j-- > 0;)
      sum = hn::Add(sum, hn::LoadU(d, terms + j * kRowFloats + kLead + u - j));
    hn::Store(sum, d, s.totals + u);
    const VF mean = hn::Div(sum, hn::Mul(rowWeight, hn::Load(d, s.columnWeight + u)));
    const VF clamped = hn::Min(hn::Max(mean, zero), top);
    hn::StoreU(hn::DemoteTo(d8, hn::ConvertTo(di, clamped)), d8, s.bytes + u);
  }
}

// Row y's sums, averages and output bytes, the sums of its next 7 pixels carried.
void WriteRow(const Scratch& s, const Plane& plane, size_t first, size_t y, size_t tile) {
  float* carried = s.carried ? s.carried + y * kCarried : nullptr;
  if (carried) std::copy(carried, carried + kCarried, s.partial);
  FinishRow(s, y, tile);
  if (carried) std::copy(s.totals + tile, s.totals + tile + kCarried, carried);
  uint8_t* out = plane.dst + static_cast<ptrdiff_t>(y) * plane.stride + first * plane.step;
  if (plane.step == 1) {
    std::memcpy(out, s.bytes, tile);
    return;
  }
  size_t u = 0;
#if HWY_TARGET != HWY_SCALAR
  if (plane.step == 4) {
    const DU du;
    const DPixelBytes d8;
    const hn::Rebind<uint8_t, DU> dBytes;
    const int shift = static_cast<int>(8 * plane.channel);
    const auto others = hn::Set(du, ~(0xFFu << shift));
    for (; u + hn::Lanes(du) <= tile; u += hn::Lanes(du)) {
      uint8_t* pixels = out - plane.channel + 4 * u;
      const auto kept = hn::And(hn::BitCast(du, hn::LoadU(d8, pixels)), others);
      const auto sample =
          hn::ShiftLeftSame(hn::PromoteTo(du, hn::LoadU(dBytes, s.bytes + u)), shift);
      hn::StoreU(hn::BitCast(d8, hn::Or(kept, sample)), d8, pixels);
    }
  }
#endif
  for (; u < tile; ++u) out[u * plane.step] = s.bytes[u];
}

// A tile's state before block row 0: the first 7 rows transformed, row 7 loaded.
void StartTile(const Scratch& s, const Plane& plane, size_t first, size_t tile, size_t rows) {
  std::fill(s.terms[0], s.terms[0] + 16 * kRowFloats, 0.0f);
  std::fill(s.sums, s.sums + 64 * kTileBlocks, 0.0f);
  for (size_t u = 0; u < kRowFloats; ++u) {
    // 64 times the blocks over the column: the scaled transforms' gain.
    s.columnWeight[u] = static_cast<float>(64 * (std::min<size_t>(first + u, 7) + 1));
  }
  LoadSamples(plane, 0, rows, first, tile + 7, s.samples[0]);
  for (size_t row = 0; row < 7; ++row) {
    LoadSamples(plane, row + 1, rows, first, tile + 7, s.samples[(row + 1) % 2]);
    RowTransforms(s, s.samples[row % 2], row, tile);
  }
}

// Block row y of a tile. Row y - 1 is written a step late, once block row y is done: still
// before anything reads a row below y + 7, and it lets the stores of each step settle before
// the next step reads them. The last row is left to the caller.
void StepTile(const Scratch& s, const Plane& plane, size_t first, size_t tile, size_t y,
              size_t blockRows, const float* thresholds) {
  RowTransforms(s, s.samples[(y + 7) % 2], (y + 7) % 8, tile);
  if (y + 1 < blockRows)
    LoadSamples(plane, y + 8, blockRows + 8, first, tile + 7, s.samples[y % 2]);
  Blocks(s, y, tile, thresholds);
  if (y > 0) WriteRow(s, plane, first, y - 1, tile);
  InverseRows(s, y, tile);
}

}  // namespace

// One 8-point transform, a lane at a time.
template <bool kScaled>
void OneTransform(const float* in, float* out, bool inverse) {
  const hn::CappedTag<float, 1> d1;
  using V1 = hn::Vec<decltype(d1)>;
  V1 x[8], X[8];
  for (int n = 0; n < 8; ++n) x[n] = hn::LoadU(d1, in + n);
  Transform<kScaled>(d1, x, X, inverse);
  for (int k = 0; k < 8; ++k) hn::StoreU(X[k], d1, out + k);
}

void Dct8OfTarget(const float* in, float* out, bool inverse) {
  OneTransform<false>(in, out, inverse);
}

void Dct8x8OfTarget(const float* in, float* out, bool inverse) {
  // Rows are the columns of the transposed block.
  float t[64], u[64];
  Transpose(in, t);
  Columns(t, t, inverse);
  Transpose(t, u);
  Columns(u, out, inverse);
}

void Dct8x8ColumnsOfTarget(const float* rows, float* out) { Columns(rows, out, false); }

void Dct8ScaledOfTarget(const float* in, float* out, bool inverse) {
  OneTransform<true>(in, out, inverse);
}

bool DctDenoisePlaneOfTarget(const uint8_t* src, uint8_t* dst, int width, int height,
                             ptrdiff_t stride, float threshold, size_t step, size_t channels) {
  const size_t blockColumns = static_cast<size_t>(width) - 8;
  const size_t blockRows = static_cast<size_t>(height) - 8;
  const size_t tiles = (blockColumns + kTileBlocks - 1) / kTileBlocks;
  const size_t group = std::min(tiles, kGroupTiles);
  // Only planes of more than one tile carry sums.
  const size_t carried = tiles > 1 ? kCarried * blockRows : 0;
  const size_t floats = group * kTileFloats + carried;
  float* scratch = new (std::align_val_t(kAlignment), std::nothrow) float[floats]();  // zero-filled
  if (!scratch) return false;
  float thresholds[64];
  DctScaledThresholds(threshold, thresholds);
  const auto state = [&](size_t t) {
    float* tile = scratch + (t % group) * kTileFloats;
    float* rows = tile + 128 * kTileBlocks;
    return Scratch{tile,
                   tile + 64 * kTileBlocks,
                   {rows, rows + 8 * kRowFloats},
                   {rows + 16 * kRowFloats, rows + 17 * kRowFloats},
                   rows + 18 * kRowFloats,
                   rows + 19 * kRowFloats,
                   rows + 20 * kRowFloats,
                   reinterpret_cast<uint8_t*>(rows + 21 * kRowFloats),
                   carried ? scratch + group * kTileFloats : nullptr};
  };
  const auto tileWidth = [&](size_t t) {
    return std::min(kTileBlocks, blockColumns - t * kTileBlocks);
  };
  for (size_t channel = 0; channel < channels; ++channel) {
    const Plane plane{src + channel, dst + channel, stride, step, channel};
    if (carried) std::fill(scratch + group * kTileFloats, scratch + floats, 0.0f);
    for (size_t g0 = 0; g0 < tiles; g0 += group) {
      const size_t g1 = std::min(tiles, g0 + group);
      for (size_t t = g0; t < g1; ++t) {
        StartTile(state(t), plane, t * kTileBlocks, tileWidth(t), blockRows + 8);
      }
      for (size_t y0 = 0; y0 < blockRows; y0 += kBandRows) {
        const size_t y1 = std::min(blockRows, y0 + kBandRows);
        for (size_t t = g0; t < g1; ++t) {
          const Scratch s = state(t);
          for (size_t y = y0; y < y1; ++y) {
            StepTile(s, plane, t * kTileBlocks, tileWidth(t), y, blockRows, thresholds);
          }
        }
      }
      for (size_t t = g0; t < g1; ++t) {
        WriteRow(state(t), plane, t * kTileBlocks, blockRows - 1, tileWidth(t));
      }
    }
  }
  ::operator delete[](scratch, std::align_val_t(kAlignment));
  return true;
}

const char* Dct8TargetOfThisTarget() { return hwy::TargetName(HWY_TARGET); }

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {

HWY_EXPORT(Dct8OfTarget);
HWY_EXPORT(Dct8x8OfTarget);
HWY_EXPORT(Dct8x8ColumnsOfTarget);
HWY_EXPORT(Dct8ScaledOfTarget);
HWY_EXPORT(DctDenoisePlaneOfTarget);
HWY_EXPORT(Dct8TargetOfThisTarget);

void Dct8(const float* in, float* out, bool inverse) {
  HWY_DYNAMIC_DISPATCH(Dct8OfTarget)(in, out, inverse);
}

void Dct8x8(const float* in, float* out, bool inverse) {
  HWY_DYNAMIC_DISPATCH(Dct8x8OfTarget)(in, out, inverse);
}

void Dct8x8Columns(const float* rows, float* out) {
  HWY_DYNAMIC_DISPATCH(Dct8x8ColumnsOfTarget)(rows, out);
}

void Dct8Scaled(const float* in, float* out, bool inverse) {
  HWY_DYNAMIC_DISPATCH(Dct8ScaledOfTarget)(in, out, inverse);
}

double DctForwardGain(int k) {
  // sqrt(8) times 1 for k = 0, else sqrt(2) cos(k pi / 16).
  const double pi = 3.14159265358979323846;
  return std::sqrt(8.0) * (k == 0 ? 1.0 : std::sqrt(2.0) * std::cos(k * pi / 16));
}

void DctScaledThresholds(float threshold, float out[64]) {
  // Worked out in double and rounded once; the coefficients they meet carry the same gains.
  for (int k = 0; k < 8; ++k) {
    for (int j = 0; j < 8; ++j) {
      out[8 * k + j] = static_cast<float>(DctForwardGain(j) * DctForwardGain(k) * threshold);
    }
  }
}

bool DctDenoisePlane(const uint8_t* src, uint8_t* dst, int width, int height, ptrdiff_t stride,
                     float threshold, size_t step, size_t channels) {
  return HWY_DYNAMIC_DISPATCH(DctDenoisePlaneOfTarget)(src, dst, width, height, stride, threshold,
                                                       step, channels);
}

const char* Dct8Target() { return HWY_DYNAMIC_DISPATCH(Dct8TargetOfThisTarget)(); }

}  // namespace tfx
#endif  // HWY_ONCE
