// Row kernels for temperatureAdjustment's HSL round trip, one set per instruction set compiled
// in, picked at run time. Every set gives the bytes of CxImage::RGBtoHSL followed by
// CxImage::HSLtoRGB, so callers may use any of them; tests run them all.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace tfx {

struct HslRelightRows {
  const char* name;  // the instruction set, as Highway names it
  // Rewrites `count` consecutive 4-byte pixels in place; red is byte `red` (0 or 2), blue the
  // other of the two, alpha byte 3 and kept. Each colour goes through the per-channel tables
  // (entries 0..255), then RGBtoHSL; its lightness is replaced by (max + min) / 2 of the pixel as
  // it came in, and HSLtoRGB gives the result.
  void (*relight)(uint8_t* pixels, size_t count, int red, const int32_t mixRed[256],
                  const int32_t mixGreen[256], const int32_t mixBlue[256]);
};

// RGBtoHSL's saturation as HSLtoRGB reads it, s / 255 in float, at max * 256 + min (min <=
// max): it depends on nothing else. Built on first use; every set reads it.
const float* HslSaturationByMaxMin();

// The set Highway's dispatch picks for this CPU, chosen on the first call.
const HslRelightRows& BestHslRelightRows();
// One set per instruction set both compiled in and run by this CPU, best first.
std::vector<const HslRelightRows*> SupportedHslRelightRows();

}  // namespace tfx
