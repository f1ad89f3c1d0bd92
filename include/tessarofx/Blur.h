// Blurs and sliding-window statistics over raw 8-bit pixel buffers.
//
// None of these functions keeps state or reports an error: bad input (a null pointer, a size
// below 1, a radius outside the range stated, a buffer over 2^31 - 1 bytes) returns without
// touching the buffers. Every filter costs O(1) per pixel in the radius. The row stride each one
// assumes is part of its contract:
//   stackblur, gaussianBlur        width * channels rounded up to a multiple of 4 bytes
//   fastAverageBlur                width * channels
//   window filters (one plane)     width
// Any thread may call any of them; calls on different buffers may run at once.
#pragma once

#include <cstdint>

#include "tessarofx/Export.h"

// The Stack Blur multiplier and shift per radius 0..255: (sum * mul[r]) >> shr[r] approximates
// sum / (r + 1)^2, with shr = floor(log2((r + 1)^2)) + 9 and mul = ceil(2^shr / (r + 1)^2).
extern TFX_API const uint16_t stackblur_mul[256];
extern TFX_API const uint8_t stackblur_shr[256];

// One pass of the 8-bit Stack Blur, in place: pass 1 blurs every row, pass 2 every column; any
// other pass does nothing. Only the first three bytes of a pixel are filtered. With 4 channels
// the fourth byte is alpha: it is kept, and colour is clamped to it (premultiplied data stays
// premultiplied). With 3 channels colour is clamped to 255; with any other channel count the
// clamp limit is 0, so the first three bytes of every pixel become 0 (all of them when a pixel
// has fewer). Radius 0..255. Does nothing for a null buffer, a size of 0, channels below 1, a
// radius above 255, a pass other than 1 or 2, or a buffer (stride * height) over 2^31 - 1 bytes.
TFX_API void stackblur(unsigned char* pixels, unsigned int width, unsigned int height, int channels,
                       unsigned int radius, int pass);

// Both Stack Blur passes, rows then columns. Radius 1..254; anything else does nothing, as do a
// null buffer, a size below 1 and whatever stackblur refuses.
TFX_API void gaussianBlur(unsigned char* pixels, int width, int height, int channels, int radius);

// Box blur of (2 radius + 1)^2 with edge samples repeated, in place; each window sum is divided
// with truncation. Channels 1 and 3 blur every byte; with 4 channels only the first byte of each
// pixel is blurred and the other three are left as they were. Does nothing for a null buffer, a
// radius below 1, a width or channel count below 1, a height not above the radius, or
// width * height * channels over 2^31 - 1 bytes.
TFX_API void fastAverageBlur(unsigned char* pixels, int width, int height, int channels,
                             int radius);

// Window filters: `dst` (width * height bytes) receives a statistic of the window
// [x - radius, x + radius] x [y - radius, y + radius] of `src`, clipped to the plane. Radius
// below 1 copies the plane. On planes at most 2 radius wide the last column is counted but not
// summed when the window slides onto it; that is the defined result. Any radius is accepted: from
// max(width, height) - 1 on, every window is the whole plane. A null plane, a size below 1 or a
// plane over 2^31 - 1 bytes does nothing, not even the copy.
//
// Mean: window sum / count, truncated.
TFX_API void fastWindowAverageFilter(const unsigned char* src, unsigned char* dst, int width,
                                     int height, int radius);
// Variance: (sumsq - sum^2 / count) / count in unsigned 64-bit with truncating divisions,
// stored as its low byte (variances above 255 wrap, not clamp).
TFX_API void fastWindowVarianceFilter(const unsigned char* src, unsigned char* dst, int width,
                                      int height, int radius);
// Percentile: the smallest value v whose running count reaches
// min(trunc(float(count + 1) * clamp(percentile, 0, 1)), count). 0 gives the minimum, 1 the
// maximum, 0.5 the median; NaN counts as 0. The histogram counters are 8-bit and wrap on windows of
// more than 255 pixels (radius 8 and up), which is the defined result.
TFX_API void fastFilter(const unsigned char* src, unsigned char* dst, int width, int height,
                        int radius, float percentile);

// The percentile scan over an 8-bit histogram of `bins` entries: the first index whose bin is
// non-zero and whose running total reaches `target`; `bins` when none does. 0, reading nothing,
// for a null histogram or bins < 1. Exactly `bins` counters are read.
TFX_API int calFilterValue(const unsigned char* histogram, int bins, int target);
