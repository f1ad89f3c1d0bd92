// Global tone and colour adjustments on a CxImage: exposure, brightness, contrast, vibrance and
// saturation, each with its per-pixel form.
//
// The image functions change blue, green and red in place, keep alpha, and return the image
// they were given. A strength of exactly 0 leaves everything untouched, and so does an image that
// is null, has no pixels, or whose header does not describe its buffer: a bpp other than 8, 16,
// 24 or 32, a stride shorter than a row, or a size other than stride * height (as when that
// product wrapped 32 bits).
// Out-of-range strengths are not rejected; the formulas are applied as they stand. Every image
// format is accepted; 32-bit BGRA and RGBA take a vectorised path that gives the same bytes as
// the per-pixel accessors.
#pragma once

#include "tessarofx/CxImage.h"
#include "tessarofx/Export.h"

// Multiplies each channel by 2^(e / 50 * 0.6): e = 50 is about x1.516, e = -50 about x0.660.
TFX_API CxImage* exposureAdjustment(CxImage* image, float e);

// b > 0 scales each channel by b / 100 + 1. b < 0 subtracts (1 / (b / 253 + 0.99) - 1) * 153,
// which is about 1.5 levels for the smallest negative b (the step at 0 is intended), and about
// 104.25 at b = -100. Unlike the other functions this one walks width * height consecutive
// pixels of bpp / 8 bytes from the first byte, ignoring row padding, and changes the first
// three bytes of each.
TFX_API CxImage* brightnessAdjustment(CxImage* image, float b);

// c > 0 stretches the channels away from mid-grey, c < 0 compresses them towards it; see
// calContrastColor. From c = 184 up the stretch saturates at its steepest ramp.
TFX_API CxImage* contrastAdjustment(CxImage* image, float c);

// Pushes colour away from (v > 0) or towards (v < 0) each pixel's grey, the more so the less
// saturated the pixel is. Greys are unchanged.
TFX_API CxImage* vibranceAdjustment(CxImage* image, float v);

// Scales each pixel's HSL saturation by s / 100: s = -100 gives the grey of the pixel's
// lightness, s = 100 the fully saturated colour. Greys are unchanged.
TFX_API CxImage* saturationAdjustment(CxImage* image, float s);

// Exposure on one pixel: each channel times `gain`, limited to 0..255 and truncated.
TFX_API tagRGBQUAD calPowColor(tagRGBQUAD c, float gain);

// Contrast on one pixel with the limits contrastAdjustment derives. lo < 1 compresses: each
// channel becomes channel * d / 255 - lo. Otherwise it stretches: channels up to lo become 0,
// above hi 255, between them (channel - lo) * 255 / d. Exact integer division, limited to 0..255,
// for any int arguments; d = 0 stretches everything above lo to 255.
TFX_API tagRGBQUAD calContrastColor(tagRGBQUAD c, int lo, int hi, int d);

// (min + max) / 2 of the three colour channels, rounded down.
TFX_API unsigned char calLuma(tagRGBQUAD c);

// Each of the four bytes minus `luma`, floored at 0.
TFX_API tagRGBQUAD calMask(tagRGBQUAD c, unsigned char luma);

// Vibrance on one pixel. `mask` is the byte negation of calLuma(calMask(c, luma)), so the least
// saturated colours get the largest weight; `strength` is v / 100 * 0.8. With
// k = trunc(mask * strength), each channel becomes (channel * (k + 256) - luma * k) >> 8,
// limited to 0..255.
TFX_API tagRGBQUAD mixLumaAndColor(tagRGBQUAD c, unsigned char luma, unsigned char mask,
                                   float strength);

// Saturation on one pixel for a factor s = strength / 100 (see saturationAdjustment).
TFX_API tagRGBQUAD calNewColor(tagRGBQUAD c, float s);
