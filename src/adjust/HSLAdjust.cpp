// Eight-band hue, saturation and lightness.
//
// Everything that depends on the hue alone (the band weights and the three sums they give) is
// folded into a table of 1536 hue steps per parameter set. Packed 32-bit pixels then go through
// a vector kernel, compiled once per instruction set by foreach_target.h and picked at run time,
// whose lanes work on the highest, lowest and middle channel value and move the three results
// into place at the end. Each step there rounds exactly as the per-pixel form used for the other
// layouts does (where a step is rewritten, the line above it says why it rounds alike), so both
// give the bytes the formulas in HSLAdjust.h define. Nothing is fused into a multiply-add (no
// MulAdd, and the build passes -ffp-contract=off).
#ifndef TFX_ADJUST_HSLADJUST_SHARED
#define TFX_ADJUST_HSLADJUST_SHARED

#include "tessarofx/HSLAdjust.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "image/ImageLayout.h"
#include "simd/hsl_adjust_rows.h"

namespace tfx {
namespace {

constexpr int kHueSteps = 1536;  // 256 per sextant

// Per hue step: hue shift in sextants, chroma factor, lightness before the grey fade (+0 only
// where no band touches the step), unused.
struct Tables {
  HSLBands bands;
  bool active;
  alignas(64) float hue[kHueSteps * 4];
};

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

#endif  // TFX_ADJUST_HSLADJUST_SHARED

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "adjust/HSLAdjust.cpp"
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
  const VF shift = hn::GatherIndex(df, table, index);
  const VF k = hn::GatherIndex(df, table + 1, index);
  const VF light = hn::GatherIndex(df, table + 2, index);
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
void AdjustRows(uint8_t* dst, size_t dstStride, const uint8_t* src, size_t srcStride, size_t rows,
                size_t count, const float* table, bool rgba) {
  if (rgba) {
    AdjustRowsOf<0>(dst, dstStride, src, srcStride, rows, count, table);
  } else {
    AdjustRowsOf<16>(dst, dstStride, src, srcStride, rows, count, table);
  }
}

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {

HWY_EXPORT(AdjustRows);

namespace {

constexpr double kCentres[kHSLBandCount] = {0, 30, 60, 120, 180, 240, 270, 300};

// Band values are clamped to -100..100 and NaN reads as 0.
double Clamped(float v) {
  if (std::isnan(v)) return 0.0;
  return std::min(100.0, std::max(-100.0, static_cast<double>(v)));
}

struct BandShape {
  double centre;
  double edge[2];  // towards lower, higher hues
  double fade[2];
  double shift;  // degrees
  double sat;
  double light;
};

BandShape Shape(int i, const HSLBandValues& v) {
  const int prev = (i + kHSLBandCount - 1) % kHSLBandCount;
  const int next = (i + 1) % kHSLBandCount;
  const double gapPrev = std::fmod(kCentres[i] - kCentres[prev] + 360.0, 360.0);
  const double gapNext = std::fmod(kCentres[next] - kCentres[i] + 360.0, 360.0);
  const double scale = std::exp2(Clamped(v.width) / 100.0);
  const double soft = Clamped(v.soft);
  const double f = soft >= 0.0 ? 0.5 + 0.5 * soft / 100.0 : 0.5 + 0.4 * soft / 100.0;
  const double hue = Clamped(v.hue);
  BandShape s;
  s.centre = kCentres[i];
  s.edge[0] = gapPrev / 2.0 * scale;
  s.edge[1] = gapNext / 2.0 * scale;
  s.fade[0] = f * s.edge[0];
  s.fade[1] = f * s.edge[1];
  s.shift = hue / 100.0 * (hue >= 0.0 ? gapNext : gapPrev);
  s.sat = Clamped(v.sat) / 100.0;
  s.light = Clamped(v.light) / 100.0;
  return s;
}

double Weight(const BandShape& s, double angle) {
  double d = angle - s.centre;
  if (d >= 180.0) d -= 360.0;
  if (d < -180.0) d += 360.0;
  const int side = d < 0.0 ? 0 : 1;
  double t = (s.edge[side] + s.fade[side] - std::fabs(d)) / (2.0 * s.fade[side]);
  t = std::min(1.0, std::max(0.0, t));
  return t * t * (3.0 - 2.0 * t);
}

void Build(const HSLBands& bands, Tables* t) {
  t->bands = bands;
  BandShape shapes[kHSLBandCount];
  t->active = false;
  for (int i = 0; i < kHSLBandCount; ++i) {
    shapes[i] = Shape(i, bands.band[i]);
    t->active |= shapes[i].shift != 0.0 || shapes[i].sat != 0.0 || shapes[i].light != 0.0;
  }
  for (int j = 0; j < kHueSteps; ++j) {
    const double angle = j * (360.0 / kHueSteps);
    double shift = 0.0, sat = 0.0, light = 0.0;
    for (const BandShape& s : shapes) {
      const double w = Weight(s, angle);
      shift += w * s.shift;
      sat += w * s.sat;
      light += w * s.light;
    }
    shift -= 360.0 * std::floor((shift + 180.0) / 360.0);
    float* entry = t->hue + 4 * j;
    entry[0] = static_cast<float>(shift / 60.0);
    entry[1] = static_cast<float>(std::max(0.0, 1.0 + sat));
    entry[2] = static_cast<float>(std::min(1.0, std::max(-1.0, light)));
    entry[3] = 0.0f;
    // A lightness of exactly +0 marks a step no band touches; a touched one with no lightness
    // change holds -0, which lights every value by a zero just the same.
    const bool untouched = entry[0] == 0.0f && entry[1] == 1.0f && entry[2] == 0.0f;
    entry[2] = untouched ? 0.0f : entry[2] == 0.0f ? -0.0f : entry[2];
  }
}

// The last parameter set's tables, one per thread: effects on different threads never share
// them, and a filter that keeps its settings builds them once.
const Tables& TablesFor(const HSLBands& bands) {
  thread_local std::unique_ptr<Tables> cache;
  if (!cache) {
    cache = std::make_unique<Tables>();
    Build(bands, cache.get());
  } else if (std::memcmp(&cache->bands, &bands, sizeof(HSLBands)) != 0) {
    Build(bands, cache.get());
  }
  return *cache;
}

uint8_t RoundToByte(float v) {
  const float rounded = v + 0.5f;
  if (!(rounded >= 0.0f)) return 0;
  if (rounded >= 255.0f) return 255;
  return static_cast<uint8_t>(static_cast<int>(rounded));
}

// One pixel in place, for layouts the kernel does not take; the same operations as its lanes.
// False when the pixel stays as it is.
bool AdjustPixel(uint8_t& red, uint8_t& green, uint8_t& blue, const Tables& t) {
  const int r = red, g = green, b = blue;
  const int mx = std::max(r, std::max(g, b));
  const int mn = std::min(r, std::min(g, b));
  const int c = mx - mn;
  if (c == 0) return false;
  int p;
  if (r == mx) {
    p = g - b + (g < b ? 6 * c : 0);
  } else if (g == mx) {
    p = 2 * c + b - r;
  } else {
    p = 4 * c + r - g;
  }
  const float* e = t.hue + 4 * (256 * p / c);
  const float shift = e[0], k = e[1], light = e[2];
  if (shift == 0.0f && k == 1.0f && light == 0.0f) return false;

  const float cf = static_cast<float>(c);
  float v[3] = {static_cast<float>(r), static_cast<float>(g), static_cast<float>(b)};
  if (shift != 0.0f) {
    float q = static_cast<float>(p) + shift * cf;
    const float turn = static_cast<float>(6 * c);
    if (q < 0.0f) {
      q += turn;
    } else if (q >= turn) {
      q -= turn;
    }
    int sector = 0;
    for (int n = 1; n <= 5; ++n) sector += q >= static_cast<float>(n * c) ? 1 : 0;
    const float x = q - static_cast<float>(sector * c);
    // mx, mn, rise, fall for each channel, by sextant.
    static constexpr uint8_t kPick[6][3] = {{0, 2, 1}, {3, 0, 1}, {1, 0, 2},
                                            {1, 3, 0}, {2, 1, 0}, {0, 1, 3}};
    const float values[4] = {static_cast<float>(mx), static_cast<float>(mn),
                             static_cast<float>(mn) + x, static_cast<float>(mx) - x};
    for (int i = 0; i < 3; ++i) v[i] = values[kPick[sector][i]];
  }
  if (k != 1.0f) {
    const int sum = mx + mn;
    const float m = static_cast<float>(sum) * 0.5f;
    const float limit = static_cast<float>(255 - std::abs(sum - 255));
    const float s = std::min(cf * k, limit) / cf;
    for (float& x : v) x = m + (x - m) * s;
  }
  const float l = light * std::min(1.0f, cf * (1.0f / 64.0f));
  if (l != 0.0f) {
    for (float& x : v) x = x + (l > 0.0f ? 255.0f - x : x) * l;
  }
  red = RoundToByte(v[0]);
  green = RoundToByte(v[1]);
  blue = RoundToByte(v[2]);
  return true;
}

}  // namespace

void HslAdjustInto(uint8_t* dst, const uint8_t* src, size_t count, const HSLBands& bands) {
  const Tables& t = TablesFor(bands);
  if (!t.active) {
    if (dst != src) std::memmove(dst, src, 4 * count);
    return;
  }
  HWY_DYNAMIC_DISPATCH(AdjustRows)(dst, 0, src, 0, 1, count, t.hue, false);
}

}  // namespace tfx

CxImage* hslAdjustment(CxImage* image, const HSLBands& bands) {
  if (!tfx::IsSoundImage(image)) return image;
  const tfx::Tables& t = tfx::TablesFor(bands);
  if (!t.active) return image;

  const _ImagePixelFormat format = image->getFormat();
  if (image->GetBpp() == 32 && (format == IPF_BGRA || format == IPF_RGBA)) {
    const size_t width = image->GetWidth();
    const size_t height = image->GetHeight();
    const size_t stride = image->GetEffWidth();
    const bool packed = stride == width * 4;
    HWY_DYNAMIC_DISPATCH(tfx::AdjustRows)
    (image->GetBits(), stride, image->GetBits(), stride, packed ? 1 : height,
     packed ? width * height : width, t.hue, format == IPF_RGBA);
    return image;
  }
  for (unsigned long y = 0; y < image->GetHeight(); ++y) {
    for (unsigned long x = 0; x < image->GetWidth(); ++x) {
      tagRGBQUAD c = image->GetPixelColor(x, y, true);
      if (tfx::AdjustPixel(c.rgbRed, c.rgbGreen, c.rgbBlue, t)) image->SetPixelColor(x, y, c);
    }
  }
  return image;
}
#endif  // HWY_ONCE
