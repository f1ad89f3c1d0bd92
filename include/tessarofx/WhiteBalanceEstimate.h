// Measures how a white-balanced image differs in colour from its source, in the units of a
// host's temperature and tint sliders, and the colour-science steps behind the measure.
//
// Images are width * height 32-bit pixels without row padding, bytes blue, green, red, alpha.
// An image above INT_MAX bytes counts as a size below 1 (the functions return as stated for
// that). Colour conversions are in float, the rates in double. No state is shared between calls.
#pragma once

#include <cstdint>

#include "tessarofx/Export.h"

// The mean of byte `channel` (0, 1 or 2; 3 sums nothing and gives 0) over all pixels, as the low
// byte of the truncated 64-bit mean. 255 for a null image, a channel outside 0..3, or a size
// below 1.
TFX_API unsigned char channelMean(const unsigned char* pixels, int width, int height, int channel);

// A placeholder that performs no balancing: it copies the first row of `width` pixels into
// `dst` and returns `dst`. A null pointer or a size below 1 returns `src`.
TFX_API unsigned char* doAutoWhiteBalance(unsigned char* src, unsigned char* dst, int width,
                                          int height);

// sRGB bytes to CIE XYZ (D65).
TFX_API void rgb2xyz(unsigned char r, unsigned char g, unsigned char b, float& X, float& Y,
                     float& Z);
// XYZ to chromaticity: x = X / (X + Y + Z), y = Y / (X + Y + Z), and Y unchanged.
TFX_API void xyz2xy(float X, float Y, float Z, float& x, float& y, float& Yout);
// The correlated colour temperature of chromaticity (x, y) from the cubic in
// n = (x - 0.332) / (0.1858 - y), returned as its reciprocal in mireds, truncated (D65: 153).
// INT64_MIN when that is no number of 64 bits (the 0 / 0 chromaticity of black).
TFX_API int64_t xy_to_CCT_Hernandez1999(float x, float y);

// The temperature change from `src` to `corrected` as a slider position: the mired difference
// of their mean colours over 11500 (the 64-bit difference wraps), limited to -1..1, times 10000.
// A null image counts as white; a size below 1 gives 0. Equal images give exactly 0.
TFX_API double getAutoWhiteBalanceCCTChangeRate(const unsigned char* src,
                                                const unsigned char* corrected, int width,
                                                int height);
// The tint change as a slider position: the relative change of the red mean, limited to -1..1,
// times 100 (the red channel is the measure, by design). A null image counts as white; a size
// below 1 gives 0. Equal images give exactly 0, black ones included; a black source gives 100
// for any redder result.
TFX_API double getAutoWhiteBalanceTintChangeRate(const unsigned char* src,
                                                 const unsigned char* corrected, int width,
                                                 int height);

// The black-body temperature in kelvin, in steps of 100, whose colour lies within 4/255 of
// (r, g, b) on the channels the search compares; the end of the searched range when none does.
TFX_API int64_t rgb2temperature(int r, int g, int b);
