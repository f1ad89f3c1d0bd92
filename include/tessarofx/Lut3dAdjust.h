// The colour, light and white-balance adjustments applied to a 3D LUT lattice instead of an
// image, so that a host can bake a chain of adjustments into one CubeLut and apply it with
// CubeLut::doLUT (or upload it to the OpenCL effects) in a single pass.
//
// Each function takes the same strength as its image form, applies that form's formula to every
// used lattice point (N x N x N of them, N = lut->getLutSize()) and returns the lut it was given.
// A lattice point is an RGB colour in 0..255 units, so a point is treated exactly as a pixel of
// that colour would be, with these differences:
//   - the values are floats in and out: nothing is truncated to whole levels, so a chain of
//     twins does not accumulate the rounding a chain of image functions does;
//   - a result is limited to 0..255 exactly where the image form limits it; hdrHighlight and
//     hdrShadow store the low 8 bits unclamped, and their twins do not clamp either;
//   - constants an image form derives from its strength (gains, contrast limits, weights, the
//     tint factor, the black-body colour) are derived the same way, integer steps included;
//   - the byte atlas of the lut (the OpenCL upload copy) is rewritten with the new points.
// A null lut, a lut of size 0 and a neutral strength (0; 11500 for temperature) change nothing,
// not even the atlas. Strengths are not range-checked, as in the image forms.
//
// Applied to a lattice whose points are whole levels, a twin agrees with its image form on that
// colour to within the image form's final truncation (the image value is the twin's value
// truncated) for exposure, brightness, contrast, saturation, the four light operations and the
// effect's balance. Vibrance and tint round intermediate values in the image form (a halved
// lightness, a weight, a luma, a shift), and temperature quantises hue, saturation and lightness
// to bytes on its way through HSL, so those twins follow the formula between the image form's
// steps rather than on them.
//
// Adjustments without a twin: the automatic white balance (whiteBalanceAdjustment) and the
// AutoWhiteBalance estimator derive their gains from the whole image (its brightest pixels, its
// near-white blocks), which a lattice does not have: run them on the image itself, before or
// after the baked table. Vignette, lens and frame functions depend on pixel position, which a
// colour LUT cannot express.
//
// Threading: a lut is used by one thread at a time, as everywhere else.
#pragma once

#include "tessarofx/CubeLut.h"
#include "tessarofx/Export.h"

// ColorAdjust's operations (tessarofx/ColorAdjust.h), in the order the effect applies them.
TFX_API CubeLut* lut3d_exposureAdjustment(CubeLut* lut, float e);
TFX_API CubeLut* lut3d_brightnessAdjustment(CubeLut* lut, float b);
TFX_API CubeLut* lut3d_contrastAdjustment(CubeLut* lut, float c);
// The image form's mask luma L is a whole number, and a mask luma of 0 gives no weight; here a
// mask luma below one level gives no weight, and above it the weight is 256 - L unrounded.
TFX_API CubeLut* lut3d_vibranceAdjustment(CubeLut* lut, float v);
TFX_API CubeLut* lut3d_saturationAdjustment(CubeLut* lut, float s);

// LightAdjust's operations (tessarofx/LightAdjust.h), in the order the effect applies them. M is
// the point's largest component.
TFX_API CubeLut* lut3d_hdrHighlight(CubeLut* lut, float h);
TFX_API CubeLut* lut3d_hdrShadow(CubeLut* lut, float s);
TFX_API CubeLut* lut3d_hdrWhiteLevel(CubeLut* lut, float w);
TFX_API CubeLut* lut3d_hdrBlackLevel(CubeLut* lut, float k0);

// The WhiteBalanceAdjust effect's balance (AdjustWhiteBalance::Process) for a = u_temperature /
// 200 and b = u_tint / 200: blue times 1 + 0.5 b - a, green times 1 - b, red times 1 + 0.5 b + a,
// limited to 0..255. The effect's u_rgain, u_ggain and u_bgain are not applied by the effect and
// so are not taken here.
TFX_API CubeLut* lut3d_adjustWhiteBalance(CubeLut* lut, float a, float b);

// temperatureAdjustment: the black-body blend, then the HSL round trip that restores the point's
// own lightness (max + min) / 2, both in float. The hue keeps the image form's scale (42 per sixth
// of the circle, 255 for all of it) and its wrap modulo 256.
TFX_API CubeLut* lut3d_temperatureAdjustment(CubeLut* lut, long t);

// tintAdjustment with k = trunc(t * 100) >> 8 as there: red and blue gain Y * k / 256, green
// loses as much, with Y = (117 blue + 601 green + 306 red) / 1024; limited to 0..255.
TFX_API CubeLut* lut3d_tintAdjustment(CubeLut* lut, float t);
