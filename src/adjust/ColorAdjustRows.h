// Row kernels behind the colour adjustments, one set per instruction set, and the adjustments
// themselves with the kernel set as an argument so that tests can run every set the machine
// supports against the same reference.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "tessarofx/CxImage.h"

namespace tfx {

// Each kernel rewrites `count` consecutive 4-byte pixels in place: bytes 0..2 are colour (in
// either order: every operation treats the three channels alike), byte 3 is alpha and is kept.
// Rows need no particular alignment.
struct ColorAdjustRows {
  const char* name;
  void (*applyTable)(uint8_t* pixels, size_t count, const uint8_t table[256]);
  // strength = v / 100 * 0.8
  void (*vibrance)(uint8_t* pixels, size_t count, float strength);
  // sigma = s / 100, not 0
  void (*saturation)(uint8_t* pixels, size_t count, float sigma);
};

// The fastest set this CPU runs, chosen once.
const ColorAdjustRows& BestColorAdjustRows();
// Every set this CPU runs, fastest first; the last one runs anywhere.
std::vector<const ColorAdjustRows*> SupportedColorAdjustRows();

CxImage* ExposureAdjust(CxImage* image, float e, const ColorAdjustRows& rows);
CxImage* BrightnessAdjust(CxImage* image, float b, const ColorAdjustRows& rows);
CxImage* ContrastAdjust(CxImage* image, float c, const ColorAdjustRows& rows);
CxImage* VibranceAdjust(CxImage* image, float v, const ColorAdjustRows& rows);
CxImage* SaturationAdjust(CxImage* image, float s, const ColorAdjustRows& rows);

}  // namespace tfx
