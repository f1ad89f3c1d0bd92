// The lut3d_ twins: the adjustment formulas of src/adjust evaluated on lattice floats.
//
// The per-value arithmetic comes from the adjustments' formula headers, so a twin and its image
// form cannot drift apart; what is written here is only what the image forms do in integers
// (contrast, vibrance, tint, the HSL round trip) redone in float.
#include "tessarofx/Lut3dAdjust.h"

#include "adjust/ColorAdjustFormulas.h"
#include "adjust/LightAdjustFormulas.h"
#include "adjust/WhiteBalanceFormulas.h"
#include "tessarofx/CxImage.h"

namespace {

// 0..255; NaN passes through, as nothing defines a level for it.
float Limit(float v) { return v < 0.0f ? 0.0f : v > 255.0f ? 255.0f : v; }

float Max3(const float* p) {
  const float rg = p[0] > p[1] ? p[0] : p[1];
  return rg > p[2] ? rg : p[2];
}

float Min3(const float* p) {
  const float rg = p[0] < p[1] ? p[0] : p[1];
  return rg < p[2] ? rg : p[2];
}

// Calls point(rgb) on every used lattice point, red, green, blue in that order, and refreshes the
// point's byte in the atlas. The lattice keeps its capacity of 64 points per axis whatever N is.
template <class PointFn>
CubeLut* ForEachPoint(CubeLut* lut, PointFn point) {
  if (!lut) return lut;
  int n = 0;
  float* lattice = lut->getLut3DData(&n, nullptr, nullptr, nullptr);
  if (n < 1 || n > CubeLut::kMaxSize) return lut;
  constexpr int kCap = CubeLut::kMaxSize;
  for (int i = 0; i < n; ++i) {
    for (int j = 0; j < n; ++j) {
      for (int k = 0; k < n; ++k) {
        float* p = lattice + ((i * kCap + j) * kCap + k) * 3;
        point(p);
        lut->updateCalcuatedData(k, j, i, CubeLut::PR{p[0], p[1], p[2]});
      }
    }
  }
  return lut;
}

// Each component through the same per-value function.
template <class ValueFn>
CubeLut* ForEachValue(CubeLut* lut, ValueFn value) {
  return ForEachPoint(lut, [&](float* p) {
    for (int c = 0; c < 3; ++c) p[c] = value(p[c]);
  });
}

float ContrastValue(float v, const tfx::ContrastLimits& limits) {
  const auto lo = static_cast<float>(limits.lo);
  const auto d = static_cast<float>(limits.d);
  if (limits.lo < 1) return Limit(v * d / 255.0f - lo);
  if (v <= lo) return 0.0f;
  if (v > static_cast<float>(limits.hi)) return 255.0f;
  return Limit((v - lo) * 255.0f / d);
}

void VibrancePoint(float* p, float strength) {
  const float luma = (Min3(p) + Max3(p)) / 2.0f;
  const float mask[3] = {Limit(p[0] - luma), Limit(p[1] - luma), Limit(p[2] - luma)};
  const float maskLuma = (Min3(mask) + Max3(mask)) / 2.0f;
  // The image form negates a byte: a mask luma of 0 weighs nothing, any other L weighs 256 - L.
  // Its L is rounded down, so here everything below one level weighs nothing.
  const float amount = maskLuma < 1.0f ? 0.0f : 256.0f - maskLuma;
  const float k = amount * strength;
  for (int c = 0; c < 3; ++c) p[c] = Limit((p[c] * (k + 256.0f) - luma * k) / 256.0f);
}

template <class WeightFn, class CurveFn>
CubeLut* LightPoints(CubeLut* lut, WeightFn weight, CurveFn curve) {
  return ForEachPoint(lut, [&](float* p) {
    const float k = weight(Max3(p));
    for (int c = 0; c < 3; ++c) p[c] = curve(p[c], k);
  });
}

// CxImage::RGBtoHSL with the lightness replaced by `l` (0..255), then CxImage::HSLtoRGB, with
// none of their byte steps. The hue scale is theirs: 42 to a sixth of the circle, 85 and 170 for
// green and blue, 255 for the whole, and a negative hue wraps modulo 256 as the byte does.
void Relight(float* p, float l) {
  const float cMax = Max3(p), cMin = Min3(p);
  if (cMax == cMin) {
    p[0] = p[1] = p[2] = l;  // saturation 0: every channel is the lightness
    return;
  }
  const float sum = cMax + cMin;
  const float d = cMax - cMin;
  // The byte form picks its denominator by its own lightness (sum * 255 + 255) / 510 <= 127,
  // which for whole channels is sum < 255; at 255 both denominators are 255.
  const float s = d / (sum <= 255.0f ? sum : 510.0f - sum);
  const float rDelta = (cMax - p[0]) * 42.0f / d;
  const float gDelta = (cMax - p[1]) * 42.0f / d;
  const float bDelta = (cMax - p[2]) * 42.0f / d;
  float h = p[0] == cMax   ? bDelta - gDelta
            : p[1] == cMax ? 85.0f + rDelta - bDelta
                           : 170.0f + gDelta - rDelta;
  if (h < 0.0f) h += 256.0f;
  const float hue = h * 360.0f / 255.0f;
  const float lf = l / 255.0f;
  const float q = lf <= 0.5f ? (1.0f + s) * lf : lf + s - lf * s;
  const float pf = 2.0f * lf - q;
  p[2] = CxImage::HueToRGB(pf, q, hue - 120.0f) * 255.0f;
  p[1] = CxImage::HueToRGB(pf, q, hue) * 255.0f;
  p[0] = CxImage::HueToRGB(pf, q, hue + 120.0f) * 255.0f;
}

}  // namespace

CubeLut* lut3d_exposureAdjustment(CubeLut* lut, float e) {
  if (e == 0.0f) return lut;
  const float gain = tfx::ExposureGain(e);
  return ForEachValue(lut, [&](float v) { return Limit(v * gain); });
}

CubeLut* lut3d_brightnessAdjustment(CubeLut* lut, float b) {
  if (b == 0.0f) return lut;
  const float k = tfx::BrightnessFactor(b);
  return ForEachValue(lut, [&](float v) { return Limit(tfx::BrightnessValue(v, k)); });
}

CubeLut* lut3d_contrastAdjustment(CubeLut* lut, float c) {
  if (c == 0.0f) return lut;
  const tfx::ContrastLimits limits = tfx::DeriveContrast(c);
  return ForEachValue(lut, [&](float v) { return ContrastValue(v, limits); });
}

CubeLut* lut3d_vibranceAdjustment(CubeLut* lut, float v) {
  if (v == 0.0f) return lut;
  const float strength = tfx::VibranceStrength(v);
  return ForEachPoint(lut, [&](float* p) { VibrancePoint(p, strength); });
}

CubeLut* lut3d_saturationAdjustment(CubeLut* lut, float s) {
  if (s == 0.0f) return lut;
  const float sigma = s / 100.0f;
  return ForEachPoint(lut, [&](float* p) {
    const float mx = Max3(p), mn = Min3(p);
    if (mx == mn) return;
    const tfx::SaturationSpread spread = tfx::SpreadOf(mx, mn);
    for (int c = 0; c < 3; ++c) p[c] = Limit(tfx::SaturatedChannel(p[c], spread, sigma));
  });
}

CubeLut* lut3d_hdrHighlight(CubeLut* lut, float h) {
  if (h == 0.0f) return lut;
  const float a = tfx::HighlightFactor(h);
  return LightPoints(
      lut, [&](float m) { return tfx::BrightWeight(m, a); }, tfx::Curve);
}

CubeLut* lut3d_hdrShadow(CubeLut* lut, float s) {
  if (s == 0.0f) return lut;
  const float a = tfx::ShadowFactor(s);
  return LightPoints(
      lut, [&](float m) { return tfx::DarkWeight(m, a); }, tfx::Curve);
}

CubeLut* lut3d_hdrWhiteLevel(CubeLut* lut, float w) {
  if (w == 0.0f) return lut;
  const float a = tfx::WhiteLevelFactor(w);
  return LightPoints(
      lut, [&](float m) { return tfx::BrightWeight(m, a); },
      [](float ch, float k) { return Limit(tfx::WhiteCurve(ch, k)); });
}

CubeLut* lut3d_hdrBlackLevel(CubeLut* lut, float k0) {
  if (k0 == 0.0f) return lut;
  const float a = tfx::BlackLevelFactor(k0);
  return LightPoints(
      lut, [&](float m) { return tfx::DarkWeight(m, a); },
      [](float ch, float k) { return Limit(tfx::Curve(ch, k)); });
}

CubeLut* lut3d_adjustWhiteBalance(CubeLut* lut, float a, float b) {
  // Factors of exactly 1 leave an image's bytes alone but would still clamp points outside
  // 0..255, so a neutral balance returns early like every other twin.
  if (a == 0.0f && b == 0.0f) return lut;
  const tfx::BalanceFactors f = tfx::DeriveBalance(a, b);
  return ForEachPoint(lut, [&](float* p) {
    p[0] = Limit(p[0] * f.red);
    p[1] = Limit(p[1] * f.green);
    p[2] = Limit(p[2] * f.blue);
  });
}

CubeLut* lut3d_temperatureAdjustment(CubeLut* lut, long t) {
  if (t == 11500) return lut;
  const tfx::TemperatureBlend blend = tfx::DeriveTemperature(t);
  const float tint[3] = {blend.red, blend.green, blend.blue};
  return ForEachPoint(lut, [&](float* p) {
    const float l = (Max3(p) + Min3(p)) / 2.0f;
    for (int c = 0; c < 3; ++c) {
      p[c] = Limit(tfx::MixValue(p[c], tfx::TintedChannel(p[c], tint[c]), blend.w));
    }
    Relight(p, l);
    for (int c = 0; c < 3; ++c) p[c] = Limit(p[c]);
  });
}

CubeLut* lut3d_tintAdjustment(CubeLut* lut, float t) {
  if (t == 0.0f) return lut;
  const auto k = static_cast<float>(tfx::TintFactor(t));
  return ForEachPoint(lut, [&](float* p) {
    const float y = (117.0f * p[2] + 601.0f * p[1] + 306.0f * p[0]) / 1024.0f;
    p[0] = Limit(p[0] + y * k / 256.0f);
    p[1] = Limit(p[1] + y * -k / 256.0f);
    p[2] = Limit(p[2] + y * k / 256.0f);
  });
}
