// Vignette on a CxImage: darkens (or lightens) the frame outside a centred ellipse with a
// cosine-feathered edge, and changes the exposure of the inside.
//
// A mask of one float per pixel (1 inside the ellipse, 0 beyond its feathered edge) drives a
// per-pixel blend between the two gains. The image function keeps alpha and returns the image it
// was given; amount and exposure both 0 leave everything untouched, and so does an image that is
// null, has no pixels, or whose header does not describe its buffer (a bpp other than 8, 16, 24
// or 32, a stride shorter than a row, or a size other than stride * height). Every format is
// accepted; 32-bit BGRA takes a row path that gives the same bytes as vignettePixel through the
// accessors.
#pragma once

#include "tessarofx/CxImage.h"
#include "tessarofx/Export.h"

// Percent arguments, as the effect's parameters carry them (note the order):
//   amount      -100..100: gain 1 + amount / 100 outside the ellipse (-100 gives black)
//   feather     0..100: width of the cosine transition, relative to the larger semi-axis
//   highlights  0..100: 50 is neutral; above it the outside's dark tones are lifted, below it
//               they are pushed down, in proportion to |amount|
//   size        0..100: inner semi-axes from 0.2 (0) to 1.0 (100) of the half-width/height
//   roundness   0..100: pulls the longer semi-axis towards the shorter (100: a circle);
//               negative values leave the ellipse as it is
//   exposure    gain 2^(exposure / 100) inside the ellipse
TFX_API CxImage* vignetteAdjustFilter(CxImage* img, float amount, float feather, float highlights,
                                      float size, float roundness, float exposure);

// Fills mask[y * width + x] with the vignette weight of each pixel: 1 inside the ellipse, a
// raised cosine falling to 0 across the feather band, 0 beyond it. feather, size and roundness
// are fractions (the percent values divided by 100). A null mask, a width or height below 1, or
// a mask above INT_MAX bytes does nothing.
TFX_API void generateGradient(int width, int height, float feather, float size, float roundness,
                              float* mask);

// One pixel blended with mask weight g: each channel is scaled by (1 + a)(1 - g) + e * g; where
// g < 1 the result then goes through the tone curve 255 - (255 - v)(255 - w v) / 255 with
// w = (1 - mean / 255) (1 - g)^2 b, mean being the average of the scaled red, green and blue.
// Channels end at 0 below 0, else trunc(min(255, v)). Alpha is kept.
TFX_API tagRGBQUAD vignettePixel(tagRGBQUAD c, float g, float a, float e, float b);

// Euclidean distance between (x1, y1) and (x2, y2), in float.
TFX_API float distance(float x1, float y1, float x2, float y2);
