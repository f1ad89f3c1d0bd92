// Eight-band hue, saturation and lightness.
//
// Everything that depends on the hue alone (the band weights and the three sums they give) is
// folded into a table of 1536 hue steps per parameter set. Packed 32-bit pixels then go through
// the vector kernel of simd/hsl_adjust_rows_hwy.cpp, which gives the bytes of the per-pixel form
// used here for the other layouts.
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
  HslAdjustRows(dst, 0, src, 0, 1, count, t.hue, false);
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
    tfx::HslAdjustRows(image->GetBits(), stride, image->GetBits(), stride, packed ? 1 : height,
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
