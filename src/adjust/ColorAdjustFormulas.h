// The arithmetic of the colour adjustments that does not depend on channels being bytes: what
// each operation derives from its strength, and the per-value expressions. The image functions
// feed them bytes and truncate the result; the LUT-lattice twins feed them lattice floats and
// keep the result as a float.
#pragma once

#include <climits>
#include <cmath>
#include <cstdint>

namespace tfx {

// Float to int toward zero; out-of-range values and NaN give INT_MIN, as the x86 conversion
// instructions (and so the vector kernels) do, instead of being undefined.
inline int TruncToInt(float v) {
  if (v >= -2147483648.0f && v < 2147483648.0f) return static_cast<int>(v);
  return INT_MIN;
}

inline float ExposureGain(float e) {
  // The exponent and the power in double, the gain used as float.
  return static_cast<float>(std::pow(2.0, static_cast<double>(e) / 50.0 * 0.6));
}

// A factor when positive, an offset when not.
inline float BrightnessFactor(float b) {
  // Positive b in float; the negative curve in double (its constants are not exact in float),
  // stored as float.
  return b > 0.0f ? b / 100.0f + 1.0f
                  : static_cast<float>((1.0 / (static_cast<double>(b) / 253.0 + 0.99) - 1.0) *
                                       -255.0 * 0.6);
}

// The sign of k, not of b, picks factor or offset: below b = -250.47 k turns positive.
inline float BrightnessValue(float v, float k) { return k > 0.0f ? v * k : v + k; }

struct ContrastLimits {
  int lo;
  int hi;
  int d;
};

inline ContrastLimits DeriveContrast(float c) {
  // t and lo's product in float.
  const float t = c > 0.0f ? 1.0f / (1.0f - c / 255.0f) - 1.0f : c / 255.0f;
  ContrastLimits limits;
  limits.lo = TruncToInt(t * 100.0f * 0.5f);
  if (255 - static_cast<int64_t>(limits.lo) < limits.lo) {
    limits.lo = 120;
    limits.hi = 127;
  } else {
    // hi comes from lo before its lower clamp; when that clamp applies, hi goes unused. Unsigned,
    // so that the INT_MIN of an infinite t wraps instead of overflowing.
    limits.hi = static_cast<int>(static_cast<uint32_t>(255) - static_cast<uint32_t>(limits.lo));
    if (limits.lo < -127) limits.lo = -120;
  }
  limits.d = limits.lo < 0 ? 255 + 2 * limits.lo : 255 - 2 * limits.lo;
  return limits;
}

inline float VibranceStrength(float v) {
  // v / 100 in float, the 0.8 scale in double, stored as float.
  return static_cast<float>(static_cast<double>(v / 100.0f) * 0.8);
}

// What saturation needs of a colour besides its channels, from its largest and smallest
// channel (0..255). Everything in float.
struct SaturationSpread {
  float sum;    // (max + min) / 255
  float l;      // sum / 2
  float delta;  // (max - min) / 255
  float lv;     // l * 255
};

inline SaturationSpread SpreadOf(float mx, float mn) {
  SaturationSpread p;
  p.sum = (mx + mn) / 255.0f;
  p.l = p.sum / 2.0f;
  p.delta = (mx - mn) / 255.0f;
  p.lv = p.l * 255.0f;
  return p;
}

// The saturation of a colour that is not a grey (max > min).
inline float SaturationOf(const SaturationSpread& p) {
  return p.l < 0.5f ? p.delta / p.sum : p.delta / (2.0f - p.sum);
}

// One channel f under saturation s, given its colour's lv and, when s >= 0, the gain a.
inline float SaturatedBy(float f, float lv, float s, float a) {
  return s >= 0.0f ? f + (f - lv) * a : lv + (f - lv) * (1.0f + s);
}

// One channel f under saturation s = strength / 100, before any limiting. The colour must not be
// a grey (max > min).
inline float SaturatedChannel(float f, const SaturationSpread& p, float s) {
  if (s >= 0.0f) {
    const float sat = SaturationOf(p);
    return SaturatedBy(f, p.lv, s, sat + s >= 1.0f ? 1.0f / sat - 1.0f : 1.0f / (1.0f - s) - 1.0f);
  }
  return SaturatedBy(f, p.lv, s, 0.0f);
}

}  // namespace tfx
