#include "lut/CubeLutApply.h"

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <initializer_list>
#include <memory>

#include "simd/lut_tetra_rows.h"

#if defined(__linux__)
#include <sys/mman.h>
#endif

namespace tfx {
namespace {

constexpr int kStrideR = 64 * 64 * 3;  // lattice strides: red index outermost
constexpr int kStrideG = 64 * 3;
constexpr int kStrideB = 3;

// Whether neighbouring pixels of a band mostly fall in the same or adjacent cells, as in a
// picture from a camera: their corners then stay cached row by row, and sorting them into slabs
// would only add passes over the band. Judged on 64 pairs spread over the band: each is a cache
// and TLB miss, and 256 of them cost 1% of a 64-point frame.
bool Coherent(const TetraTable& t, const uint8_t* in, ptrdiff_t inPitch, int width, int rows) {
  if (width < 2) return true;
  constexpr int kPairs = 64;
  const int64_t pixels = int64_t{width - 1} * rows;
  int near = 0;
  for (int i = 0; i < kPairs; ++i) {
    const int64_t at = pixels * i / kPairs;
    const uint8_t* p = in + at / (width - 1) * inPitch + at % (width - 1) * 4;
    bool same = true;
    for (int c = 0; c < 3; ++c) {
      const int d = t.gt[p[c]] - t.gt[p[c + 4]];
      same = same && d >= -1 && d <= 1;
    }
    near += same;
  }
  return 2 * near >= kPairs;
}

// Random pixels read corners all over the lattice, and with 4 KiB pages a 33-point lattice spans
// 141 pages and a slab of a 64-point one 272, more than the first-level TLB holds; and a band
// sorted into slabs on 4 KiB pages took 5% longer on a 64-point lattice. So large blocks are whole
// 2 MiB blocks, which Linux may back with large pages on request. Null when memory runs out.
void* AllocateBlocks(size_t bytes) {
  constexpr size_t kLarge = size_t{2} << 20;
  if (bytes < kLarge / 8) return std::aligned_alloc(64, (bytes + 63) / 64 * 64);
  const size_t blocks = (bytes + kLarge - 1) / kLarge * kLarge;
  void* p = std::aligned_alloc(kLarge, blocks);
#if defined(__linux__) && defined(MADV_HUGEPAGE)
  if (p) madvise(p, blocks, MADV_HUGEPAGE);  // only advice: refused, the pages stay small
#endif
  return p;
}

}  // namespace

void FreeBlocks::operator()(void* p) const { std::free(p); }

void TetraRowReference(const TetraTable& t, uint8_t* row, int width, int bytesPerPixel) {
  const int last = t.size - 1;
  for (int x = 0; x < width; ++x, row += bytesPerPixel) {
    const int b = row[0], g = row[1], r = row[2];
    const int ri = t.gt[r], gi = t.gt[g], bi = t.gt[b];
    const float fr = t.ft[r], fg = t.ft[g], fb = t.ft[b];
    const int rn = ri + 1 < last ? ri + 1 : last;
    const int gn = gi + 1 < last ? gi + 1 : last;
    const int bn = bi + 1 < last ? bi + 1 : last;
    float out[3];
    Tetrahedral(t.lattice + ri * kStrideR + gi * kStrideG + bi * kStrideB, (rn - ri) * kStrideR,
                (gn - gi) * kStrideG, (bn - bi) * kStrideB, fr, fg, fb, out);
    row[2] = LutComponentToByte(out[0]);
    row[1] = LutComponentToByte(out[1]);
    row[0] = LutComponentToByte(out[2]);
  }
}

void TetraPlan::Prepare(const TetraTable& table, int pointFloats) {
  table_ = table;
  const int n = table.size;
  usable_ = n >= 1 && n <= 64;
  packed_ = usable_;
  for (int v = 0; v < 256 && packed_; ++v) packed_ = table.gt[v] >= 0 && table.gt[v] < n;
  if (!packed_) return;
  std::memcpy(ft_, table.ft, sizeof ft_);
  positional_ = true;
  for (int v = 0; v < 256; ++v) {
    const float lower = static_cast<float>(table.gt[v]);
    position_[v] = lower + table.ft[v];
    const float floor = std::floor(position_[v]), rest = position_[v] - floor;
    positional_ =
        positional_ && floor == lower && std::memcmp(&rest, &table.ft[v], sizeof rest) == 0;
  }
  // doLUT makes each position a quotient, v / (255 / (N - 1)). A division ties up the divider
  // for many cycles, so the same quotients are sought as v * high + v * low: high keeps 16 bits
  // of the reciprocal, so that v * high (8 + 16 bits) is exact, and low is the rest. Every byte
  // is checked, so no position can differ from the table's.
  scale_[0] = scale_[1] = 0.0f;
  if (positional_ && n > 1) {
    const float divisor = 255.0f / static_cast<float>(n - 1);
    const double exact = 1.0 / static_cast<double>(divisor);
    uint32_t bits;
    float high = static_cast<float>(exact);
    std::memcpy(&bits, &high, sizeof bits);
    bits &= ~uint32_t{0xff};
    std::memcpy(&high, &bits, sizeof high);
    const float low = static_cast<float>(exact - static_cast<double>(high));
    bool same = true;
    for (int v = 0; v < 256 && same; ++v) {
      const float f = static_cast<float>(v);
      const float product = f * high, rest = f * low, where = product + rest;
      same = std::memcmp(&where, &position_[v], sizeof where) == 0;
    }
    if (same) scale_[0] = high, scale_[1] = low;
  }

  const auto point = [&](int i, int j, int k) {
    return table.lattice + ((i * 64 + j) * 64 + k) * 3;
  };
  grey_ = true;
  for (int i = 0; i < n && grey_; ++i) {
    for (int j = 0; j < n && grey_; ++j) {
      for (int k = 0; k < n; ++k) {
        const float* p = point(i, j, k);
        if (std::memcmp(p, p + 1, sizeof *p) != 0 || std::memcmp(p, p + 2, sizeof *p) != 0) {
          grey_ = false;
          break;
        }
      }
    }
  }
  // One more plane along each axis repeats the last: the upper neighbour of the last index is then
  // the point itself, as the cap makes it, and every upper neighbour is one stride on.
  const int per = grey_                                  ? 1
                  : pointFloats == 3 || pointFloats == 4 ? pointFloats
                                                         : TetraPointFloats();
  const int m = n + 1;
  stride_[0] = m * m * per;
  stride_[1] = m * per;
  stride_[2] = per;
  for (int axis = 0; axis < 3; ++axis) {
    for (int v = 0; v < 256; ++v) lower_[axis][v] = table.gt[v] * stride_[axis];
  }
  // Above about 1.5 MiB (N > 45 in colour) the corners of random pixels mostly miss the cache;
  // four slabs of 16 red cells are 17 planes of 66 KiB each.
  slabs_ = 1;
  bool rising = true;
  for (int v = 1; v < 256; ++v) rising = rising && table.gt[v] >= table.gt[v - 1];
  if (!grey_ && n > 45 && rising) {
    slabs_ = kMaxSlabs;
    const int cells = (n - 1 + kMaxSlabs - 1) / kMaxSlabs;
    for (int slab = 1; slab < kMaxSlabs; ++slab) {
      int v = 0;
      while (v < 256 && table.gt[v] < slab * cells) ++v;
      slabStart_[slab] = v;
    }
  }
  // One float more, which a 16-byte read of the last 12-byte point takes in.
  const size_t floats = static_cast<size_t>(m) * m * m * per + 1;
  if (floats > capacity_) {
    points_.reset(static_cast<float*>(AllocateBlocks(floats * sizeof(float))));
    capacity_ = points_ ? floats : 0;
    // Out of memory, the rows take the per-pixel formula, which needs no packed points.
    if (!points_) {
      packed_ = false;
      return;
    }
  }
  // doLUT packs afresh on every call, so the copy and the finiteness check are one branchless
  // pass: an all-ones exponent carries into the top bit when one more is added to it.
  uint32_t carried = 0;
  const auto note = [&carried](float f) {
    uint32_t bits;
    std::memcpy(&bits, &f, sizeof bits);
    carried |= (bits & 0x7f800000u) + 0x00800000u;
  };
  for (int v = 0; v < 256; ++v) note(ft_[v]);
  float* out = points_.get();
  for (int i = 0; i < m; ++i) {
    for (int j = 0; j < m; ++j) {
      const float* p = point(std::min(i, n - 1), std::min(j, n - 1), 0);
      if (grey_) {
        for (int k = 0; k < n; ++k, p += 3, ++out) note(*out = p[0]);
        out[0] = out[-1];
        out += 1;
      } else {
        for (int k = 0; k < n; ++k, p += 3, out += per) {
          note(out[0] = p[0]), note(out[1] = p[1]), note(out[2] = p[2]);
          if (per == 4) out[3] = 0.0f;
        }
        std::memcpy(out, out - per, per * sizeof *out);
        out += per;
      }
    }
  }
  *out = 0.0f;
  finite_ = (carried & 0x80000000u) == 0;
}

void TetraRow(const TetraPlan& plan, const uint8_t* in, uint8_t* out, int width,
              int bytesPerPixel) {
  if (width <= 0) return;
  if (!plan.Packed()) {
    if (in != out) std::memcpy(out, in, static_cast<size_t>(width) * bytesPerPixel);
    TetraRowReference(plan.Table(), out, width, bytesPerPixel);
    return;
  }
  // Highway picks the instruction set on every call, so a row costs one indirect call and the
  // choice follows hwy::SetSupportedTargetsForTest.
  TetraRowVector(plan, in, out, width, bytesPerPixel);
}

void TetraImage(const TetraPlan& plan, const uint8_t* in, int inPitch, uint8_t* pixels, int width,
                int height, int pitch, int bytesPerPixel) {
  if (!plan.Usable() || height < 1 || !in || !pixels || width < 1 || bytesPerPixel < 3) return;
  // Rows closer together than a row's bytes would run past the end of the caller's buffer; one
  // row needs no pitch at all.
  const int64_t rowBytes = int64_t{width} * bytesPerPixel;
  for (const int p : {pitch, inPitch}) {
    const int64_t span = p < 0 ? -int64_t{p} : int64_t{p};
    if (height > 1 && span < rowBytes) return;
    // Nor does any caller hold an image above INT_MAX bytes.
    if ((height - 1) * span + rowBytes > INT_MAX) return;
  }
  const bool aligned = reinterpret_cast<uintptr_t>(in) % 4 == 0 &&
                       reinterpret_cast<uintptr_t>(pixels) % 4 == 0 && inPitch % 4 == 0 &&
                       pitch % 4 == 0;
  if (plan.Packed() && plan.Slabs() > 1 && bytesPerPixel == 4 && aligned) {
    // Bands of about a million pixels: each reads the whole lattice into the cache once, slab by
    // slab, which is then a few bytes a pixel, and its sorted pixels stream through in order.
    // The storage is left uninitialised, so that only the part the pixels fill is ever touched.
    const int bandRows = std::min(height, std::max(1, (1 << 20) / width));
    const size_t needed = TetraBandScratch(width, bandRows);
    thread_local std::unique_ptr<uint32_t[], FreeBlocks> scratch;
    thread_local size_t scratchSize = 0;
    if (scratchSize < needed) {
      scratch.reset(static_cast<uint32_t*>(AllocateBlocks(needed * sizeof(uint32_t))));
      scratchSize = scratch ? needed : 0;
    }
    const auto rowsOf = [&](int y) { return std::min(bandRows, height - y); };
    const auto from = [&](int y) { return in + static_cast<ptrdiff_t>(y) * inPitch; };
    const auto to = [&](int y) { return pixels + static_cast<ptrdiff_t>(y) * pitch; };
    // A band whose neighbouring pixels mostly share their cells goes row by row; runs of the
    // others go through the slabs together.
    for (int y = 0; y < height;) {
      int end = y;
      while (end < height && scratch &&
             !Coherent(plan.Table(), from(end), inPitch, width, rowsOf(end))) {
        end += rowsOf(end);
      }
      if (end > y) {
        TetraBandsVector(plan, from(y), inPitch, to(y), pitch, width, end - y, bandRows,
                         scratch.get());
      }
      y = end;
      if (y < height) {
        for (const int stop = y + rowsOf(y); y < stop; ++y) {
          TetraRow(plan, from(y), to(y), width, 4);
        }
      }
    }
    return;
  }
  for (int y = 0; y < height; ++y) {
    TetraRow(plan, in + static_cast<ptrdiff_t>(y) * inPitch,
             pixels + static_cast<ptrdiff_t>(y) * pitch, width, bytesPerPixel);
  }
}

}  // namespace tfx
