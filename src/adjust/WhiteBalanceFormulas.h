// The arithmetic of the white-balance functions that does not depend on channels being bytes:
// what each derives from its strength, and the per-value blends. The image functions tabulate
// them over bytes; the LUT-lattice twins evaluate them on lattice floats.
#pragma once

#include <algorithm>
#include <climits>
#include <cmath>

#include "adjust/ColorAdjustFormulas.h"
#include "tessarofx/WhiteBalance.h"

namespace tfx {

// The effect's per-channel factors for a = temperature / 200 and b = tint / 200.
struct BalanceFactors {
  float blue;
  float green;
  float red;
};

inline BalanceFactors DeriveBalance(float a, float b) {
  // The factors with a double 0.5, as written, stored as float; the products are in float.
  return {static_cast<float>(1 + 0.5 * b - a), static_cast<float>(1 - b),
          static_cast<float>(1 + 0.5 * b + a)};
}

// What temperatureAdjustment derives from t (not the neutral 11500): the black-body colour as
// fractions and the blend weight.
struct TemperatureBlend {
  float red;
  float green;
  float blue;
  float w;
};

inline TemperatureBlend DeriveTemperature(long t) {
  long kelvin;
  if (t < 11500) {
    // Saturates instead of overflowing for t near LONG_MIN.
    if (__builtin_sub_overflow(26000L, t, &kelvin)) kelvin = LONG_MAX;
  } else {
    kelvin = std::max(18100 - t, 1700L);
  }
  const tagRGBQUAD colour = temperatureToRGB(kelvin);
  // The fractions in float; the weight in double, used as float.
  return {colour.rgbRed / 255.0f, colour.rgbGreen / 255.0f, colour.rgbBlue / 255.0f,
          static_cast<float>(std::fabs(1.0 - static_cast<double>(kelvin) / 11500.0) * 1.7)};
}

// A channel pulled towards the black-body colour's channel tch (a fraction), in float.
inline float TintedChannel(float ch, float tch) { return ch / 255.0f * tch * 255.0f; }

// t * w + c * (1 - w) in float.
inline float MixValue(float c, float t, float w) { return t * w + c * (1.0f - w); }

// tintAdjustment's factor: trunc(t * 100) >> 8, the product in float.
inline int TintFactor(float t) { return TruncToInt(t * 100.0f) >> 8; }

}  // namespace tfx
