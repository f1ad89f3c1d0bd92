// The lens resampling walks as gathers, compiled once per instruction set by foreach_target.h.
// Integer work only: offsets, bounds and byte masks as the per-pixel walks compute them.
#include <cstdint>
#include <cstring>

#include "simd/lens_resample.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/lens_resample_hwy.cpp"
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

// Internal linkage: other kernel files define helpers of the same names.
namespace {

using DI = hn::ScalableTag<int32_t>;
using VI = hn::Vec<DI>;

static_assert(sizeof(LensPoint) == 4, "points are read as 32-bit words");

// The points' x (low half) and y (high half), sign-extended.
HWY_INLINE VI PointX(VI p) { return hn::ShiftRight<16>(hn::ShiftLeft<16>(p)); }
HWY_INLINE VI PointY(VI p) { return hn::ShiftRight<16>(p); }

HWY_INLINE VI LoadPoints(const LensPoint* points) {
  return hn::LoadU(DI(), reinterpret_cast<const int32_t*>(points));
}

HWY_INLINE VI DistortLanes(VI points, VI own, VI rowBytes, VI last, const int32_t* src) {
  const VI pos = hn::Add(hn::Mul(PointY(points), rowBytes), PointX(points));
  // pos >= 0 and pos + 4 <= srcSize, i.e. pos <= srcSize - 4, without overflow.
  const auto inside = hn::And(hn::Not(hn::Lt(pos, hn::Zero(DI()))), hn::Not(hn::Lt(last, pos)));
  return hn::GatherOffset(DI(), src, hn::IfThenElse(inside, pos, own));
}

void DistortRow(const LensPoint* map, size_t count, int32_t rowBytes, const uint8_t* src,
                int32_t srcSize, uint8_t* dst) {
  const DI di;
  const size_t lanes = hn::Lanes(di);
  const int32_t* base = reinterpret_cast<const int32_t*>(src);
  const VI row = hn::Set(di, rowBytes);
  const VI last = hn::Set(di, srcSize - 4);
  const VI step = hn::Set(di, static_cast<int32_t>(4 * lanes));
  VI own = hn::ShiftLeft<2>(hn::Iota(di, 0));
  size_t i = 0;
  // The sources follow curves across rows that the hardware prefetcher does not foresee: ask for
  // the first source of a vector a few vectors ahead.
  const size_t ahead = 8 * lanes;
  for (; i + lanes <= count; i += lanes, own = hn::Add(own, step)) {
    if (i + ahead < count) {
      const int64_t pos = int64_t{map[i + ahead].y} * rowBytes + map[i + ahead].x;
      if (pos >= 0 && pos < srcSize) __builtin_prefetch(src + pos);
    }
    hn::StoreU(DistortLanes(LoadPoints(map + i), own, row, last, base), di,
               reinterpret_cast<int32_t*>(dst + 4 * i));
  }
  if (i < count) {
    // Points past the end read as (0, 0), offset 0, which every source holds.
    HWY_ALIGN int32_t tail[HWY_MAX_BYTES / 4] = {};
    std::memcpy(tail, map + i, 4 * (count - i));
    hn::Store(DistortLanes(hn::Load(di, tail), own, row, last, base), di, tail);
    std::memcpy(dst + 4 * i, tail, 4 * (count - i));
  }
}

HWY_INLINE VI WordOffsets(VI points, VI stride) {
  return hn::Add(hn::Mul(PointY(points), stride), hn::ShiftLeft<2>(PointX(points)));
}

HWY_INLINE VI FringeLanes(VI blue, VI green, VI red, VI stride, const int32_t* src) {
  const DI di;
  const VI b = hn::GatherOffset(di, src, WordOffsets(blue, stride));
  const VI g = hn::GatherOffset(di, src, WordOffsets(green, stride));
  const VI r = hn::GatherOffset(di, src, WordOffsets(red, stride));
  return hn::Or(hn::Or(hn::And(b, hn::Set(di, 0x000000ff)),
                       hn::And(g, hn::Set(di, static_cast<int32_t>(0xff00ff00u)))),
                hn::And(r, hn::Set(di, 0x00ff0000)));
}

void FringeRow(const LensPoint* blue, const LensPoint* green, const LensPoint* red, size_t count,
               const uint8_t* src, int32_t stride, uint8_t* dst) {
  const DI di;
  const size_t lanes = hn::Lanes(di);
  const int32_t* base = reinterpret_cast<const int32_t*>(src);
  const VI s = hn::Set(di, stride);
  size_t i = 0;
  // As in DistortRow; the three planes' sources lie close together.
  const size_t ahead = 8 * lanes;
  for (; i + lanes <= count; i += lanes) {
    if (i + ahead < count) {
      __builtin_prefetch(src + size_t(green[i + ahead].y) * size_t(stride) +
                         size_t(green[i + ahead].x) * 4);
    }
    hn::StoreU(
        FringeLanes(LoadPoints(blue + i), LoadPoints(green + i), LoadPoints(red + i), s, base), di,
        reinterpret_cast<int32_t*>(dst + 4 * i));
  }
  if (i < count) {
    // Points past the end read as (0, 0), the first pixel.
    HWY_ALIGN int32_t b[HWY_MAX_BYTES / 4] = {};
    HWY_ALIGN int32_t g[HWY_MAX_BYTES / 4] = {};
    HWY_ALIGN int32_t r[HWY_MAX_BYTES / 4] = {};
    std::memcpy(b, blue + i, 4 * (count - i));
    std::memcpy(g, green + i, 4 * (count - i));
    std::memcpy(r, red + i, 4 * (count - i));
    hn::Store(FringeLanes(hn::Load(di, b), hn::Load(di, g), hn::Load(di, r), s, base), di, b);
    std::memcpy(dst + 4 * i, b, 4 * (count - i));
  }
}

HWY_INLINE VI MergeChannels(VI b, VI g, VI r) {
  const DI di;
  return hn::Or(hn::Or(hn::And(b, hn::Set(di, 0x000000ff)),
                       hn::And(g, hn::Set(di, static_cast<int32_t>(0xff00ff00u)))),
                hn::And(r, hn::Set(di, 0x00ff0000)));
}

void FringeOffsetsRow(const int32_t* blue, const int32_t* green, const int32_t* red, size_t count,
                      const uint8_t* src, uint8_t* dst) {
  const DI di;
  const size_t lanes = hn::Lanes(di);
  const int32_t* base = reinterpret_cast<const int32_t*>(src);
  const size_t ahead = 8 * lanes;  // as in DistortRow
  size_t i = 0;
  for (; i + lanes <= count; i += lanes) {
    if (i + ahead < count) __builtin_prefetch(src + green[i + ahead]);
    const VI b = hn::GatherOffset(di, base, hn::LoadU(di, blue + i));
    const VI g = hn::GatherOffset(di, base, hn::LoadU(di, green + i));
    const VI r = hn::GatherOffset(di, base, hn::LoadU(di, red + i));
    hn::StoreU(MergeChannels(b, g, r), di, reinterpret_cast<int32_t*>(dst + 4 * i));
  }
  for (; i < count; ++i) {
    uint32_t b, g, r;
    std::memcpy(&b, src + blue[i], 4);
    std::memcpy(&g, src + green[i], 4);
    std::memcpy(&r, src + red[i], 4);
    const uint32_t pixel = (b & 0x000000ffu) | (g & 0xff00ff00u) | (r & 0x00ff0000u);
    std::memcpy(dst + 4 * i, &pixel, 4);
  }
}

static_assert(sizeof(LensBlock) == 64, "a block is one vector on the widest targets");

#if HWY_TARGET == HWY_AVX3_DL
// Byte 4i + c of the pixel vector takes plane (blue, green, red, green)[c]'s index of pixel i,
// plus c: the byte of the source word that channel comes from.
HWY_INLINE __m512i BlockBytes(const LensBlock& block, __m512i spread) {
  const __m512i indices = _mm512_load_si512(&block);
  return _mm512_add_epi8(_mm512_permutexvar_epi8(spread, indices), _mm512_set1_epi32(0x03020100));
}

// Every byte of one plane from its four row windows: two 128-byte permutes (bit 6 picks the row
// within each pair) and bit 7 between them. Windows of rows the block does not use are pulled
// back inside the frame; their bytes are never picked.
HWY_INLINE __m512i PlaneBytes(const uint8_t* src, int32_t base, int32_t rowBytes, int32_t last,
                              __m512i bytes, __mmask64 upper) {
  const auto window = [&](int row) {
    const int32_t at = base + row * rowBytes;
    return _mm512_loadu_si512(src + (at < last ? at : last));
  };
  const __m512i low = _mm512_permutex2var_epi8(window(0), bytes, window(1));
  const __m512i high = _mm512_permutex2var_epi8(window(2), bytes, window(3));
  return _mm512_mask_blend_epi8(upper, low, high);
}
#endif  // HWY_TARGET == HWY_AVX3_DL

void FringeBlocksRow(const LensBlock* blocks, size_t count, const int32_t* spill, int32_t rowBytes,
                     const uint8_t* src, int32_t srcSize, uint8_t* dst) {
  const DI di;
  const size_t lanes = hn::Lanes(di);
  const hn::Rebind<uint8_t, DI> d8;
  const int32_t* words = reinterpret_cast<const int32_t*>(src);
  const VI row = hn::Set(di, rowBytes);
  const VI low6 = hn::Set(di, 63);
#if HWY_TARGET == HWY_AVX3_DL
  HWY_ALIGN uint8_t order[64];
  for (int i = 0; i < 64; ++i) {
    const int plane[4] = {0, 1, 2, 1};
    order[i] = static_cast<uint8_t>(16 * plane[i & 3] + (i >> 2));
  }
  const __m512i spread = _mm512_load_si512(order);
  const int32_t last = srcSize - 64;
#else
  static_cast<void>(srcSize);
#endif
  // Sources follow curves the hardware prefetcher does not foresee: ask for each plane's first
  // window a few blocks ahead, and for the blocks themselves a little further.
  const size_t ahead = 8;
  const size_t total = (count + 15) / 16;
  for (size_t b = 0; b < total; ++b, dst += 64) {
    const LensBlock& block = blocks[b];
    if (b + ahead < total) {
      for (int p = 0; p < 3; ++p) __builtin_prefetch(src + blocks[b + ahead].base[p]);
    }
    if (b + 16 < total) __builtin_prefetch(blocks + b + 16);
    if (block.spill >= 0) {
      const int32_t* offsets = spill + 48 * size_t(block.spill);
      const size_t n = count - 16 * b < 16 ? count - 16 * b : 16;
      FringeOffsetsRow(offsets, offsets + 16, offsets + 32, n, src, dst);
      continue;
    }
#if HWY_TARGET == HWY_AVX3_DL
    const __m512i bytes = BlockBytes(block, spread);
    const __mmask64 upper = _mm512_movepi8_mask(bytes);
    const __m512i blue = PlaneBytes(src, block.base[0], rowBytes, last, bytes, upper);
    const __m512i green = PlaneBytes(src, block.base[1], rowBytes, last, bytes, upper);
    const __m512i red = PlaneBytes(src, block.base[2], rowBytes, last, bytes, upper);
    const __m512i blueGreen = _mm512_mask_blend_epi8(0xaaaaaaaaaaaaaaaaull, blue, green);
    _mm512_storeu_si512(dst, _mm512_mask_blend_epi8(0x4444444444444444ull, blueGreen, red));
#else
    for (size_t l = 0; l < 16; l += lanes) {
      VI v[3];
      for (int p = 0; p < 3; ++p) {
        const VI index = hn::PromoteTo(di, hn::LoadU(d8, block.index[p] + l));
        const VI offset = hn::Add(hn::Add(hn::Set(di, block.base[p]), hn::And(index, low6)),
                                  hn::Mul(hn::ShiftRight<6>(index), row));
        v[p] = hn::GatherOffset(di, words, offset);
      }
      hn::StoreU(MergeChannels(v[0], v[1], v[2]), di, reinterpret_cast<int32_t*>(dst + 4 * l));
    }
#endif
  }
}

// Coding one plane of a block from the distortion map's (x, y) at its points, which give the
// offset y * rowBytes + x. The rows span the block's lowest to highest (a curve may turn within
// a block); the bytes start two left of the leftmost of the first and last pixels', since
// along a curve the pixels between seldom stray further. Windows inside the frame hold every
// offset they code, so no source of a coded block leaves the frame.
bool ComposePlane(const LensPoint* points, const int32_t* distort, int32_t width, int32_t size,
                  uint8_t index[16], int32_t* base) {
  const DI di;
  const hn::RebindToUnsigned<DI> du;
  const size_t lanes = hn::Lanes(di);
  const hn::Rebind<uint8_t, DI> d8;
  const int32_t rowBytes = width * 4;
  const VI vwidth = hn::Set(di, width);
  HWY_ALIGN int32_t words[16];
  VI lowY = hn::Set(di, hwy::LimitsMax<int32_t>());
  VI highY = hn::Set(di, hwy::LimitsMin<int32_t>());
  for (size_t l = 0; l < 16; l += lanes) {
    const VI point = LoadPoints(points + l);
    const VI j = hn::Add(hn::Mul(PointY(point), vwidth), PointX(point));
    const VI word = hn::GatherIndex(di, distort, j);
    lowY = hn::Min(lowY, PointY(word));
    highY = hn::Max(highY, PointY(word));
    hn::Store(word, di, words + l);
  }
  const auto x = [](int32_t word) { return int32_t{static_cast<int16_t>(word & 0xffff)}; };
  const int32_t x0 = (x(words[0]) < x(words[15]) ? x(words[0]) : x(words[15])) - 2;
  const int32_t y0 = hn::GetLane(hn::MinOfLanes(di, lowY));
  const int32_t rows = hn::GetLane(hn::MaxOfLanes(di, highY)) - y0;
  const int64_t start = int64_t{y0} * rowBytes + x0;
  if (rows > 3 || start < 0 || start + int64_t{rows} * rowBytes + 64 > size) return false;
  const VI vx0 = hn::Set(di, x0);
  const VI vy0 = hn::Set(di, y0);
  auto stray = hn::Zero(du);
  for (size_t l = 0; l < 16; l += lanes) {
    const VI word = hn::Load(di, words + l);
    const VI dx = hn::Sub(PointX(word), vx0);
    // Unsigned, so that bytes left of x0 count as far.
    stray = hn::Or(stray, hn::VecFromMask(du, hn::Lt(hn::Set(du, 60), hn::BitCast(du, dx))));
    const VI code =
        hn::Or(hn::ShiftLeft<6>(hn::Sub(PointY(word), vy0)), hn::And(dx, hn::Set(di, 63)));
    hn::StoreU(hn::DemoteTo(d8, code), d8, index + l);
  }
  *base = static_cast<int32_t>(start);
  return hn::AllTrue(du, hn::Eq(stray, hn::Zero(du)));
}

void ComposeBlocksRow(const LensPoint* blue, const LensPoint* green, const LensPoint* red,
                      const LensPoint* distort, size_t count, int32_t width, LensBlock* blocks) {
  const int32_t size = static_cast<int32_t>(count * 4);
  const int32_t* map = reinterpret_cast<const int32_t*>(distort);
  // As in FringeBlocksRow: the distortion entries the planes will read a few blocks ahead, and
  // the points those requests read further ahead still, so that they do not wait.
  const size_t ahead = 16;
  const LensPoint* planes[3] = {blue, green, red};
  for (size_t b = 0; b < count / 16; ++b) {
    LensBlock& block = blocks[b];
    const size_t i = 16 * b;
    if (i + 64 * ahead < count) {
      for (const LensPoint* plane : planes) __builtin_prefetch(plane + i + 64 * ahead);
    }
    if (i + 16 * ahead < count) {
      for (const LensPoint* plane : planes) {
        const LensPoint p = plane[i + 16 * ahead];
        __builtin_prefetch(map + size_t(p.y) * size_t(width) + size_t(p.x));
      }
    }
    const bool fits = ComposePlane(blue + i, map, width, size, block.index[0], &block.base[0]) &&
                      ComposePlane(green + i, map, width, size, block.index[1], &block.base[1]) &&
                      ComposePlane(red + i, map, width, size, block.index[2], &block.base[2]);
    block.spill = fits ? -1 : -2;
  }
  if (count % 16 != 0) blocks[count / 16].spill = -2;
}

using DF = hn::RebindToFloat<DI>;
using VF = hn::Vec<DF>;

// scale = {k, rescale, nx, ny}. The lanes past the last whole vector take the same float
// operations one by one.
void DistortOffsetsRow(const float* r, const float* power, const float* cosT, const float* sinT,
                       size_t count, const float scale[4], float* x, float* y) {
  const DF df;
  const size_t lanes = hn::Lanes(df);
  const VF k = hn::Set(df, scale[0]);
  const VF rescale = hn::Set(df, scale[1]);
  const VF nx = hn::Set(df, scale[2]);
  const VF ny = hn::Set(df, scale[3]);
  size_t i = 0;
  for (; i + lanes <= count; i += lanes) {
    const VF rp =
        hn::Mul(hn::Add(hn::Mul(hn::LoadU(df, power + i), k), hn::LoadU(df, r + i)), rescale);
    hn::StoreU(hn::Mul(hn::Mul(hn::LoadU(df, cosT + i), rp), nx), df, x + i);
    hn::StoreU(hn::Mul(hn::Mul(hn::LoadU(df, sinT + i), rp), ny), df, y + i);
  }
  for (; i < count; ++i) {
    const float rp = (power[i] * scale[0] + r[i]) * scale[1];
    x[i] = cosT[i] * rp * scale[2];
    y[i] = sinT[i] * rp * scale[3];
  }
}

// Toward zero; out-of-range values and NaN give INT_MIN, as the per-point form's double test
// v > -2^31 - 1 && v < 2^31 does for a float v.
HWY_INLINE VI TruncToInt(VF v) {
  const DF df;
  const DI di;
  const auto inRange =
      hn::And(hn::Ge(v, hn::Set(df, -2147483648.0f)), hn::Lt(v, hn::Set(df, 2147483648.0f)));
  return hn::IfThenElse(hn::RebindMask(di, inRange),
                        hn::ConvertTo(di, hn::IfThenElseZero(inRange, v)),
                        hn::Set(di, hwy::LimitsMin<int32_t>()));
}

int32_t TruncToInt(float v) {
  if (v >= -2147483648.0f && v < 2147483648.0f) return static_cast<int32_t>(v);
  return INT32_MIN;
}

HWY_INLINE VI PackPoint(VF ox, VF oy, VF fcx, VF fcy) {
  const DI di;
  const VI px = TruncToInt(hn::Add(ox, fcx));
  const VI py = TruncToInt(hn::Add(oy, fcy));
  return hn::Or(hn::And(px, hn::Set(di, 0xffff)), hn::ShiftLeft<16>(py));
}

LensPoint PackPoint(float ox, float oy, float fcx, float fcy) {
  return LensPoint{static_cast<int16_t>(static_cast<uint16_t>(TruncToInt(ox + fcx))),
                   static_cast<int16_t>(static_cast<uint16_t>(TruncToInt(oy + fcy)))};
}

void AssembleRow(const float* x, const float* y, bool above, int width, int cx, float fcx,
                 float fcy, LensPoint* out) {
  const DF df;
  const DI di;
  const size_t lanes = hn::Lanes(df);
  const VF vcx = hn::Set(df, fcx);
  const VF vcy = hn::Set(df, fcy);
  // Negation flips the sign bit, exactly as the per-point form's unary minus does.
  const VF flipY = hn::Set(df, above ? -0.0f : 0.0f);
  const auto sy = [&](float v) { return above ? -v : v; };
  int32_t* dst = reinterpret_cast<int32_t*>(out);
  // Right of the centre column cx + i reads entry i; left of it column cx - 1 - i reads entry
  // i + 1, negated: both walk away from the centre.
  const size_t right = static_cast<size_t>(width - cx);
  const size_t left = static_cast<size_t>(cx);
  size_t i = 0;
  for (; i + lanes <= right; i += lanes) {
    const VF oy = hn::Xor(hn::LoadU(df, y + i), flipY);
    hn::StoreU(PackPoint(hn::LoadU(df, x + i), oy, vcx, vcy), di, dst + cx + i);
  }
  for (; i < right; ++i) out[size_t(cx) + i] = PackPoint(x[i], sy(y[i]), fcx, fcy);
  for (i = 0; i + lanes <= left; i += lanes) {
    const VF ox = hn::Neg(hn::LoadU(df, x + i + 1));
    const VF oy = hn::Xor(hn::LoadU(df, y + i + 1), flipY);
    // Lane j belongs to column cx - 1 - i - j: reversed, the lanes fill columns
    // cx - i - lanes .. cx - i - 1 in order.
    hn::StoreU(hn::Reverse(di, PackPoint(ox, oy, vcx, vcy)), di, dst + (left - i - lanes));
  }
  for (; i < left; ++i) out[left - 1 - i] = PackPoint(-x[i + 1], sy(y[i + 1]), fcx, fcy);
}

const LensResampleRows* LensRowsOfThisTarget() {
  static const LensResampleRows rows = {
      hwy::TargetName(HWY_TARGET), &DistortRow,      &FringeRow,
      &FringeOffsetsRow,           &FringeBlocksRow, &ComposeBlocksRow,
      &DistortOffsetsRow,          &AssembleRow};
  return &rows;
}

}  // namespace
}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace tfx {

HWY_EXPORT(LensRowsOfThisTarget);

const LensResampleRows& BestLensResampleRows() {
  return *HWY_DYNAMIC_DISPATCH(LensRowsOfThisTarget)();
}

}  // namespace tfx
#endif  // HWY_ONCE
