// The 8-point DCT kernels, compiled once per instruction set by foreach_target.h.
//
// Every transform is the even/odd butterfly below, evaluated lane by lane in the order written,
// in single precision, with nothing fused into a multiply-add (there is no MulAdd here, and the
// build passes -ffp-contract=off although the AVX2 and AVX-512 targets enable FMA). A lane's
// result therefore never depends on how many lanes a vector has.
#include <algorithm>
#include <cstring>
#include <new>

#include "simd/dct8.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/dct8_hwy.cpp"
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
  x[0] = hn::Add(e0, o0);
  x[7] = hn::Sub(e0, o0);
  x[1] = hn::Add(e1, o1);
  x[6] = hn::Sub(e1, o1);
  x[2] = hn::Add(e2, o2);
  x[5] = hn::Sub(e2, o2);
  x[3] = hn::Add(e3, o3);
  x[4] = hn::Sub(e3, o3);
}

template <class D, class V = hn::Vec<D>>
HWY_INLINE void Transform(D d, const V* in, V* out, bool inverse) {
  if (inverse) {
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
//  - For one x, every block shares the row transforms of the 8 columns x..x+7, so those are done
//    once per row (a strip), not once per block.
//  - The inverse row transform is linear and the same for every block of that x, so each block
//    only undoes its column transform; the rows of all blocks over a strip row are summed, still
//    in the row-frequency domain, and the inverse row transform runs once per strip row.
// Everything is held column-major (one array per column or frequency), and vectors run down a
// column: one lane per row, or per block of a group of consecutive blocks.
//
// A block's rows are not added into the strip as the block is done: adding row i of the blocks
// of a group into a running sum would load each vector one float after a store it overlaps, which
// store forwarding cannot serve. Row i of every block is kept instead (in an array per i and
// frequency, indexed by block), and strip row p later sums row i of block p - i for i from 7 down
// to 0: its blocks in increasing y, the same additions in the same order on every target.
//
// A group may reach past the last block of a band. Such blocks read rows below the band (zeros,
// or an earlier band's: finite either way) and reach only rows past the band's last block,
// which are never written; rows above the first block read zeros before it.
//
// The weight of a pixel is the number of blocks covering it, (min(y, 7) + 1) * (min(x, 7) + 1)
// for every pixel the output takes from the blocks; it is formed exactly instead of counted.
//
// The plane is done in bands of block rows, so that the scratch and the rows a band walks down
// stay in the second-level cache on large planes. A band also transforms the 7 block rows above
// its first output row, so each of its rows sees all of its blocks: a pixel's arithmetic does
// not depend on the band it falls in. Those 7 rows of the source are saved before the band above
// writes over them, for a plane denoised in place.

using DF = hn::ScalableTag<float>;
using VF = hn::Vec<DF>;

// Enough for aligned loads of the widest vector.
constexpr size_t kAlignment = 64;

size_t RoundUp(size_t n, size_t step) { return (n + step - 1) / step * step; }

// Block rows per band, the 7 it shares with the band above included.
constexpr int kBandBlocks = 256;

struct Strips {
  size_t pitch;       // floats per column array, a multiple of the vector length
  size_t blockPitch;  // floats per block-row array, zeros before its first block included
  float* columns;     // 8 source columns as floats, column c in slot c % 8
  float* rows;        // the row transforms: frequency k of every row
  float* blockRows;   // row i, frequency k of every block at (i * 8 + k) * blockPitch, block 0
                      // blockPitch - pitch floats in
  float* outputs;     // 8 output columns, column c in slot c % 8, summed over x
  uint8_t* bytes;     // one finished output column

  float* BlockRow(size_t i, size_t k) const {
    return blockRows + (i * 8 + k + 1) * blockPitch - pitch;
  }
};

// Rows of the plane seen by one band: band row 0 is plane row `top`.
struct Band {
  const uint8_t* src;  // band row 0
  uint8_t* dst;        // band row 0
  ptrdiff_t stride;
  const uint8_t* saved;  // band rows 0..savedRows-1 as they were before the band above, packed
  int savedRows;
  int height;    // rows read: those of its blocks, blocks + 7
  int blocks;    // block rows
  int firstOut;  // the rows written, [firstOut, blocks)
  size_t top;
};

void LoadColumn(const Band& band, int width, int column, float* out) {
  for (int y = 0; y < band.savedRows; ++y) {
    out[y] = band.saved[static_cast<size_t>(y) * width + column];
  }
  const uint8_t* p = band.src + band.savedRows * band.stride + column;
  for (int y = band.savedRows; y < band.height; ++y, p += band.stride) out[y] = *p;
}

// The forward row transform of every strip row, columns x..x+7 being in the slots.
void RowTransforms(const Strips& s, size_t x, size_t end) {
  const DF d;
  for (size_t y = 0; y < end; y += hn::Lanes(d)) {
    VF in[8], out[8];
    for (size_t n = 0; n < 8; ++n) in[n] = hn::Load(d, s.columns + ((x + n) & 7) * s.pitch + y);
    Forward(d, in, out);
    for (size_t k = 0; k < 8; ++k) hn::Store(out[k], d, s.rows + k * s.pitch + y);
  }
}

// Every block of this x: column transform, threshold, inverse column transform.
void Blocks(const Strips& s, size_t groupEnd, float threshold) {
  const DF d;
  const VF t = hn::Set(d, threshold);
  for (size_t y0 = 0; y0 < groupEnd; y0 += hn::Lanes(d)) {
    for (size_t k = 0; k < 8; ++k) {
      const float* rows = s.rows + k * s.pitch + y0;
      VF in[8], coefficients[8], out[8];
      for (size_t i = 0; i < 8; ++i) in[i] = hn::LoadU(d, rows + i);
      Forward(d, in, coefficients);
      for (size_t j = 0; j < 8; ++j) {
        coefficients[j] = hn::IfThenZeroElse(hn::Lt(hn::Abs(coefficients[j]), t), coefficients[j]);
      }
      Inverse(d, coefficients, out);
      for (size_t i = 0; i < 8; ++i) hn::Store(out[i], d, s.BlockRow(i, k) + y0);
    }
  }
}

// Each strip row sums its blocks' rows, and the inverse row transform of the sums is added to
// output columns x..x+7.
void InverseRows(const Strips& s, size_t x, size_t groupEnd) {
  const DF d;
  for (size_t y = 0; y < groupEnd; y += hn::Lanes(d)) {
    VF in[8], out[8];
    for (size_t k = 0; k < 8; ++k) {
      in[k] = hn::LoadU(d, s.BlockRow(7, k) + y - 7);
      for (size_t i = 7; i-- > 0;) in[k] = hn::Add(in[k], hn::LoadU(d, s.BlockRow(i, k) + y - i));
    }
    Inverse(d, in, out);
    for (size_t j = 0; j < 8; ++j) {
      float* column = s.outputs + ((x + j) & 7) * s.pitch + y;
      hn::Store(hn::Add(hn::Load(d, column), out[j]), d, column);
    }
  }
}

// Output column x, now complete: the average, truncated into 0..255, in the band's output rows;
// the column's slot is cleared for column x + 8.
void FinishColumn(const Strips& s, const Band& band, size_t x, size_t groupEnd) {
  const DF d;
  const hn::RebindToSigned<DF> di;
  const hn::Rebind<uint8_t, DF> d8;
  float* column = s.outputs + (x & 7) * s.pitch;
  const VF columnWeight = hn::Set(d, static_cast<float>(std::min<size_t>(x, 7) + 1));
  const VF seven = hn::Set(d, 7.0f), one = hn::Set(d, 1.0f);
  const VF zero = hn::Zero(d), top = hn::Set(d, 255.0f);
  for (size_t y = 0; y < groupEnd; y += hn::Lanes(d)) {
    // Rows past 2^24 round, but stay above 7.
    const VF planeRow = hn::Iota(d, static_cast<float>(band.top + y));
    const VF rowWeight = hn::Add(hn::Min(planeRow, seven), one);
    const VF mean = hn::Div(hn::Load(d, column + y), hn::Mul(rowWeight, columnWeight));
    const VF clamped = hn::Min(hn::Max(mean, zero), top);
    hn::StoreU(hn::DemoteTo(d8, hn::ConvertTo(di, clamped)), d8, s.bytes + y);
    hn::Store(zero, d, column + y);
  }
  uint8_t* p = band.dst + band.firstOut * band.stride + x;
  for (int y = band.firstOut; y < band.blocks; ++y, p += band.stride) *p = s.bytes[y];
}

void DenoiseBand(const Strips& s, const Band& band, int width, float threshold) {
  const size_t lanes = hn::Lanes(DF());
  const size_t groupEnd = RoundUp(static_cast<size_t>(band.blocks), lanes);
  // The last group reads 7 rows past its end.
  const size_t rowsEnd = groupEnd + RoundUp(8, lanes);
  std::fill(s.outputs, s.outputs + 8 * s.pitch, 0.0f);
  for (int column = 0; column < 8; ++column) {
    LoadColumn(band, width, column, s.columns + column * s.pitch);
  }
  for (size_t x = 0; x < static_cast<size_t>(width - 8); ++x) {
    if (x > 0) {
      LoadColumn(band, width, static_cast<int>(x + 7), s.columns + ((x + 7) & 7) * s.pitch);
    }
    RowTransforms(s, x, rowsEnd);
    Blocks(s, groupEnd, threshold);
    InverseRows(s, x, groupEnd);
    // Column x is read no more (the next load is x + 8), so dst may be src.
    FinishColumn(s, band, x, groupEnd);
  }
}

}  // namespace

void Dct8OfTarget(const float* in, float* out, bool inverse) {
  const hn::CappedTag<float, 1> d1;
  using V1 = hn::Vec<decltype(d1)>;
  V1 x[8], X[8];
  for (int n = 0; n < 8; ++n) x[n] = hn::LoadU(d1, in + n);
  Transform(d1, x, X, inverse);
  for (int k = 0; k < 8; ++k) hn::StoreU(X[k], d1, out + k);
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

bool DctDenoisePlaneOfTarget(const uint8_t* src, uint8_t* dst, int width, int height,
                             ptrdiff_t stride, float threshold) {
  const size_t lanes = hn::Lanes(DF());
  const int blocks = height - 8;
  const size_t pitch =
      RoundUp(static_cast<size_t>(std::min(blocks, kBandBlocks)), lanes) + RoundUp(8, lanes);
  const size_t blockPitch = pitch + RoundUp(8, lanes);
  const size_t savedBytes = 7 * static_cast<size_t>(width);
  const size_t floats =
      24 * pitch + 64 * blockPitch + (pitch + 2 * savedBytes + sizeof(float) - 1) / sizeof(float);
  float* scratch = new (std::align_val_t(kAlignment), std::nothrow) float[floats]();  // zero-filled
  if (!scratch) return false;
  uint8_t* bytes = reinterpret_cast<uint8_t*>(scratch + 24 * pitch + 64 * blockPitch);
  const Strips s{pitch,
                 blockPitch,
                 scratch,
                 scratch + 8 * pitch,
                 scratch + 16 * pitch,
                 scratch + 16 * pitch + 64 * blockPitch,
                 bytes};
  uint8_t* above = bytes + pitch;
  uint8_t* below = above + savedBytes;

  for (int first = 0, out = 0; out < blocks;) {
    // Compared as a distance: first + kBandBlocks overflows on planes near INT_MAX rows.
    const int end = blocks - first > kBandBlocks ? first + kBandBlocks : blocks;
    const Band band{src + first * stride,
                    dst + first * stride,
                    stride,
                    above,
                    out - first,
                    end - first + 7,
                    end - first,
                    out - first,
                    static_cast<size_t>(first)};
    if (end < blocks) {
      for (int y = 0; y < 7; ++y) {
        std::memcpy(below + static_cast<size_t>(y) * width, src + (end - 7 + y) * stride, width);
      }
    }
    DenoiseBand(s, band, width, threshold);
    std::swap(above, below);
    out = end;
    first = end - 7;
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

bool DctDenoisePlane(const uint8_t* src, uint8_t* dst, int width, int height, ptrdiff_t stride,
                     float threshold) {
  return HWY_DYNAMIC_DISPATCH(DctDenoisePlaneOfTarget)(src, dst, width, height, stride, threshold);
}

const char* Dct8Target() { return HWY_DYNAMIC_DISPATCH(Dct8TargetOfThisTarget)(); }

}  // namespace tfx
#endif  // HWY_ONCE
