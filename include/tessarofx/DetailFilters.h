// Whole-image detail and haze adjustments on a CxImage: haze removal and addition, Laplacian
// sharpening, unsharp-mask clarity, diffuse glow and monochrome grain.
//
// Each works on the first three bytes of every pixel and keeps any fourth byte, returns the
// image it was given, and leaves it bit-identical for a strength of exactly 0 (or one that is not
// finite). Pixels are walked as one run of width * height pixels when rows are unpadded, as
// 32-bit rows are; padded rows are walked one by one and their padding is left alone. Only 24-
// and 32-bit images are changed (`sharpen`: only 32-bit ones). A null image, one without pixels,
// or one whose stride is shorter than a row or whose rows end past GetSize() is returned as is.
//
// Threads: no state is shared between calls.
#pragma once

#include <cstdint>

#include "tessarofx/CxImage.h"
#include "tessarofx/Export.h"

// Removes haze (strength > 0, percent) with a dark-channel estimate over a 15 x 15 window, or
// adds it (strength < 0), lifting every value towards white.
TFX_API CxImage* dehaze(CxImage* image, float strength);

// A new plane (width * height bytes, array new, the caller deletes it) holding the minimum of
// bytes 0..2 of every pixel. When given, *maxRGB receives the largest per-pixel maximum and
// *maxDark the largest per-pixel minimum. Null, with both out-values 0, for an image the filters
// above would return as is.
TFX_API unsigned char* getMinDarkChannel(CxImage* image, uint32_t* maxRGB, uint32_t* maxDark);

// A new plane (array new, the caller deletes it): min(dark[i], byte(trunc(mean[i] * factor)))
// for each of width * height positions, byte() keeping the low 8 bits of the 32-bit truncation
// (0 past 32 bits). Null for null planes, a size below 1, or planes above INT_MAX bytes.
TFX_API unsigned char* calL(const unsigned char* dark, const unsigned char* mean, int width,
                            int height, float factor);

// 4-neighbour Laplacian sharpening by amount / 255. The interior of the result is shifted one
// pixel to the right against the source, and the border rows and columns keep their values;
// both are the defined behaviour. The left neighbour of column 0 is the last pixel of the row
// above. Images smaller than 3 x 3, and 24-bit images (the source is addressed in 4-byte
// pixels), are left unchanged.
TFX_API CxImage* sharpen(CxImage* image, float amount);

// Unsharp mask: copy + (copy - blurred) * amount / 200, the blur a Stack Blur of radius
// trunc(amount / 2) (radius 2 for negative amounts, which soften). Amounts with |amount| <= 2
// or >= 254 are not blurred and leave the values as they were.
TFX_API CxImage* clarity(CxImage* image, float amount);

// Brightens by 1 + |sin(pi amount / 1440)| and, for positive amounts only, softens with a
// radius-1 Stack Blur (on 32-bit images colour is then capped by alpha, as gaussianBlur does).
TFX_API CxImage* diffuse(CxImage* image, float amount);

// Monochrome grain of strength (amount / 100) * (factor / 100): each pixel gets the same noise
// on its three colour bytes, a sum of four uniform values scaled to unit variance, times 127.
// The generator restarts on every call, so equal images get equal grain.
TFX_API CxImage* addNoiseFilter(CxImage* image, float amount, float factor);
