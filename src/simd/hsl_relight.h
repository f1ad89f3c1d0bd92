// Row kernels for temperatureAdjustment's HSL round trip, one set per instruction set compiled
// in, picked at run time. Every set gives the bytes of CxImage::RGBtoHSL followed by
// CxImage::HSLtoRGB, so callers may use any of them; tests run them all.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tfx {

struct HslRelightRows {
  const char* name;  // the instruction set, as Highway names it
  // Rewrites `height` rows of `width` 4-byte pixels in place, the rows `stride` bytes apart; red
  // is byte `red` (0 or 2), blue the other of the two, alpha byte 3 and kept. Each colour goes
  // through the per-channel tables, then RGBtoHSL; its lightness is replaced by (max + min) / 2
  // of the pixel as it came in, and HSLtoRGB gives the result.
  void (*relight)(uint8_t* pixels, size_t width, size_t height, size_t stride, int red,
                  const uint8_t mixRed[256], const uint8_t mixGreen[256],
                  const uint8_t mixBlue[256]);
};

// RGBtoHSL's saturation as HSLtoRGB reads it, s / 255 in float, at max * 256 + min (min <=
// max): it depends on nothing else. Built on first use; the sets that gather read it.
const float* HslSaturationByMaxMin();

// HSLtoRGB's choice per hue byte h, which fixes the hue in degrees and so, for each channel
// (hue - 120, hue, hue + 120 for blue, green, red), whether it takes p, q or the ramp
// p + (q - p) * along / 60: code holds 0 (p), 1 (q) or 2 (ramp) in bits 0-1 for blue, 2-3 for
// green and 4-5 for red. Built on first use from HueToRGB's own float steps; no hue byte puts
// two channels on the ramp, so `along` is that of the one channel that is.
// The code changes at a few hue bytes only: code[h] is steps[n], n being how many of stepStart
// (where each later run of one code begins, rising; unused ones 256) are at or below h. Kernels
// without cheap gathers count them instead of looking the code up.
constexpr int kHueSteps = 8;
struct HslHueChoice {
  float along[256];
  int32_t code[256];
  int32_t stepStart[kHueSteps];
  uint8_t steps[16];
};
const HslHueChoice& HslHueChoices();

// The set Highway's dispatch picks at the time of the call (hwy::SetSupportedTargetsForTest
// included).
const HslRelightRows& BestHslRelightRows();

}  // namespace tfx
