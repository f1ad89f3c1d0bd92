#include "tessarofx/HSLAdjust.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <vector>

#include "support/EveryTarget.h"
#include "support/ImageBuilders.h"

namespace {

using tfx_test::Clone;
using tfx_test::EveryColour;
using tfx_test::ForEveryTarget;
using tfx_test::Image;

// The per-pixel reference from the formulas: band shapes once per setting, weights afresh for
// every pixel.
struct RefBand {
  double centre, edgePrev, edgeNext, fadePrev, fadeNext, shift, sat, light;
};

double Limit(float v) { return std::isnan(v) ? 0.0 : std::clamp<double>(v, -100.0, 100.0); }

std::vector<RefBand> RefBands(const HSLBands& bands) {
  const double centres[8] = {0, 30, 60, 120, 180, 240, 270, 300};
  std::vector<RefBand> out;
  for (int i = 0; i < 8; ++i) {
    const double prev = i == 0 ? 60.0 : centres[i] - centres[i - 1];
    const double next = i == 7 ? 60.0 : centres[i + 1] - centres[i];
    const HSLBandValues& v = bands.band[i];
    const double scale = std::exp2(Limit(v.width) / 100.0);
    const double soft = Limit(v.soft);
    const double f = soft >= 0 ? 0.5 + 0.5 * soft / 100.0 : 0.5 + 0.4 * soft / 100.0;
    const double edgePrev = prev / 2.0 * scale, edgeNext = next / 2.0 * scale;
    out.push_back({centres[i], edgePrev, edgeNext, f * edgePrev, f * edgeNext,
                   Limit(v.hue) / 100.0 * (Limit(v.hue) >= 0 ? next : prev), Limit(v.sat) / 100.0,
                   Limit(v.light) / 100.0});
  }
  return out;
}

struct HueValues {
  float s, k, l;
};

HueValues RefHueValues(const std::vector<RefBand>& bands, int j) {
  const double angle = j * 360.0 / 1536.0;
  double shift = 0, sat = 0, light = 0;
  for (const RefBand& b : bands) {
    double d = angle - b.centre;
    if (d >= 180) d -= 360;
    if (d < -180) d += 360;
    const double edge = d < 0 ? b.edgePrev : b.edgeNext;
    const double fade = d < 0 ? b.fadePrev : b.fadeNext;
    const double t = std::clamp((edge + fade - std::abs(d)) / (2 * fade), 0.0, 1.0);
    const double w = t * t * (3 - 2 * t);
    shift += w * b.shift;
    sat += w * b.sat;
    light += w * b.light;
  }
  while (shift >= 180) shift -= 360;
  while (shift < -180) shift += 360;
  return {static_cast<float>(shift / 60), static_cast<float>(std::max(0.0, 1 + sat)),
          static_cast<float>(std::clamp(light, -1.0, 1.0))};
}

uint8_t RefRound(float v) {
  return static_cast<uint8_t>(std::clamp(static_cast<int>(std::trunc(v + 0.5f)), 0, 255));
}

tagRGBQUAD RefPixel(tagRGBQUAD c, const std::vector<RefBand>& bands) {
  const int r = c.rgbRed, g = c.rgbGreen, b = c.rgbBlue;
  const int mx = std::max({r, g, b}), mn = std::min({r, g, b}), chroma = mx - mn;
  if (chroma == 0) return c;
  const int p = r == mx   ? (g >= b ? g - b : 6 * chroma + g - b)
                : g == mx ? 2 * chroma + b - r
                          : 4 * chroma + r - g;
  const HueValues h = RefHueValues(bands, 256 * p / chroma);
  if (h.s == 0 && h.k == 1 && h.l == 0) return c;
  const float cf = static_cast<float>(chroma);
  float v[3] = {float(r), float(g), float(b)};
  if (h.s != 0) {
    float q = static_cast<float>(p) + h.s * cf;
    if (q < 0) {
      q += static_cast<float>(6 * chroma);
    } else if (q >= static_cast<float>(6 * chroma)) {
      q -= static_cast<float>(6 * chroma);
    }
    int k = 0;
    for (int n = 1; n <= 5; ++n) {
      if (q >= static_cast<float>(n * chroma)) k = n;
    }
    const float x = q - static_cast<float>(k * chroma);
    const float hi = float(mx), lo = float(mn), rise = lo + x, fall = hi - x;
    const float sectors[6][3] = {{hi, rise, lo}, {fall, hi, lo}, {lo, hi, rise},
                                 {lo, fall, hi}, {rise, lo, hi}, {hi, lo, fall}};
    std::copy(sectors[k], sectors[k] + 3, v);
  }
  if (h.k != 1) {
    const float m = static_cast<float>(mx + mn) / 2;
    const float s = std::min(cf * h.k, static_cast<float>(255 - std::abs(mx + mn - 255))) / cf;
    for (float& x : v) x = m + (x - m) * s;
  }
  const float l = h.l * std::min(1.0f, cf / 64);
  if (l != 0) {
    for (float& x : v) x = l > 0 ? x + (255 - x) * l : x + x * l;
  }
  return {RefRound(v[2]), RefRound(v[1]), RefRound(v[0]), c.rgbReserved};
}

void ReferenceHsl(CxImage* image, const HSLBands& bands) {
  const std::vector<RefBand> ref = RefBands(bands);
  tfx_test::MapPixels(image, [&](tagRGBQUAD c) { return RefPixel(c, ref); });
}

HSLBands Bands(std::initializer_list<std::pair<int, HSLBandValues>> values) {
  HSLBands b{};
  for (const auto& [band, v] : values) b.band[band] = v;
  return b;
}

// hue, sat, light, width, soft
const HSLBands kRedOnly = Bands({{kHSLRed, {100, -40, 25, 0, 0}}});
const HSLBands kEveryBand = Bands({{kHSLRed, {-100, 100, -60, 100, -100}},
                                   {kHSLOrange, {40, -100, 30, -50, 20}},
                                   {kHSLYellow, {100, 35, -100, 0, 100}},
                                   {kHSLGreen, {-55, 60, 15, -100, -40}},
                                   {kHSLAqua, {20, -20, 100, 60, 0}},
                                   {kHSLBlue, {-80, 100, -35, 30, 70}},
                                   {kHSLPurple, {65, -70, 45, -25, -100}},
                                   {kHSLMagenta, {-30, 10, -80, 100, 50}}});
// Widest reach and beyond-range values: shifts of several bands pile up and wrap.
const HSLBands kWide = [] {
  HSLBands b{};
  for (HSLBandValues& v : b.band) v = {250, 100, 100, 100, 300};
  b.band[kHSLGreen] = {-100, -100, -100, 100, 100};
  return b;
}();

TEST(HSLAdjust, MatchesThePerPixelFormulasOnEveryColourAndTarget) {
  const HSLBands* const settings[] = {&kRedOnly, &kEveryBand, &kWide};
  for (int i = 0; i < 3; ++i) {
    SCOPED_TRACE(i);
    const HSLBands* const bands = settings[i];
    const Image expected = Clone(EveryColour());
    ReferenceHsl(expected.get(), *bands);
    ForEveryTarget([&] {
      const Image actual = Clone(EveryColour());
      EXPECT_EQ(hslAdjustment(actual.get(), *bands), actual.get());
      EXPECT_TRUE(tfx_test::SameBuffer(*expected, *actual));
    });
  }
}

TEST(HSLAdjust, MatchesTheFormulasInEveryLayoutWidthAndPadding) {
  // Rows shorter than a vector, tails, padded rows (left alone) and packed frames taken as one
  // run; other layouts go through the accessors.
  ForEveryTarget([&] {
    for (const tfx_test::Layout& l : tfx_test::kLayouts) {
      for (const unsigned width : {1u, 5u, 17u, 40u}) {
        for (const unsigned pad : {0u, 12u}) {
          SCOPED_TRACE(testing::Message() << l.bpp << " bpp, format " << l.format << ", width "
                                          << width << ", padding " << pad);
          ASSERT_TRUE(tfx_test::SameResult(
              *tfx_test::NoiseImage(l, width, 6, pad, width + pad),
              [](CxImage* i) { hslAdjustment(i, kEveryBand); },
              [](CxImage* i) { ReferenceHsl(i, kEveryBand); }));
        }
      }
    }
  });
}

}  // namespace
