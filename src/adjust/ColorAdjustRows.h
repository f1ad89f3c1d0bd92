// The colour adjustments with the row-kernel set as an argument, so that tests can run every set
// the machine supports against the same reference.
#pragma once

#include "simd/color_adjust_rows.h"
#include "tessarofx/CxImage.h"

namespace tfx {

CxImage* ExposureAdjust(CxImage* image, float e, const ColorAdjustRows& rows);
CxImage* BrightnessAdjust(CxImage* image, float b, const ColorAdjustRows& rows);
CxImage* ContrastAdjust(CxImage* image, float c, const ColorAdjustRows& rows);
// Exposure, brightness and contrast in that order, the same bytes as the three calls; on packed,
// unpadded 32-bit images the three curves become one table and one pass.
CxImage* ToneAdjust(CxImage* image, float e, float b, float c, const ColorAdjustRows& rows);
CxImage* VibranceAdjust(CxImage* image, float v, const ColorAdjustRows& rows);
CxImage* SaturationAdjust(CxImage* image, float s, const ColorAdjustRows& rows);

}  // namespace tfx
