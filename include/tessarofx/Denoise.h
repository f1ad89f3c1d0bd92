// Noise reduction for 8-bit images: a sliding 8 x 8 DCT hard-threshold denoiser and a
// local-statistics denoiser, with the DCT kernels they are built on.
//
// Threads: no state is shared between calls; calls on different buffers may run at once.
#pragma once

#include "tessarofx/CxImage.h"
#include "tessarofx/Export.h"

// The orthonormal 8-point DCT-II of `in` into `out` (8 floats each; they may be the same
// array), or with `inverse` its transpose, the DCT-III. Null pointers do nothing, here and in
// the two block transforms below.
TFX_API void DCT8X81D(const float* in, float* out, bool inverse);
// The separable 2-D transform of an 8 x 8 row-major block (rows, then columns); `out` may be
// `in`.
TFX_API void DCT8X82D(const float* in, float* out, bool inverse);
// Completes a forward 2-D DCT: `rows` holds 8 consecutive rows of 8 floats that are already
// row-transformed; the forward transform runs down each column into `out`.
TFX_API void DCT8X82DR(const float* rows, float* out);

// Denoises one plane: every 8 x 8 block position is transformed, coefficients below 3 sigma in
// magnitude (the DC term included) are zeroed, and the inverse transforms are averaged. The
// transforms are factored for speed: the result agrees with the orthonormal transforms above to
// float rounding, and is the same on every CPU. `dst` may be `src`. The last 8 rows and the last 8
// columns are copied from the source unfiltered, so planes narrower or shorter than 9 pixels come
// back unchanged. Rows are `stride` bytes apart; a null plane, a size below 1, a stride below the
// width, or a plane above INT_MAX bytes (stride * height) does nothing.
TFX_API void dct_Denosing(const unsigned char* src, unsigned char* dst, int width, int height,
                          int stride, float sigma);

// dct_Denosing with sigma = strength * 0.15 on the red, green and blue planes of an image of 24
// or 32 bits; alpha is kept. Returned as is for strength 0, a null image, one without pixels or
// of other depths or wider than 2^27 - 2 pixels, and a header that does not describe its buffer:
// a stride shorter than a row, or GetSize() other than stride * height (a size that wrapped
// around 32 bits).
TFX_API CxImage* deNoiseRGB(CxImage* image, float strength);
// The same on the hue, saturation and lightness planes (all three, not only lightness).
TFX_API CxImage* deNoiseLumiance(CxImage* image, float strength);

// Local-statistics denoiser of one plane (stride = width), in place: with the window mean m and
// the stored variance byte v (fastWindowVarianceFilter, so wrapped) over a window of
// `windowSize` (radius (windowSize - 1) / 2), each pixel p becomes p k + m (1 - k) with
// k = v / (v + noise), truncated into 0..255. Noise 0 keeps every pixel whose variance byte is
// non-zero; where it is 0 the mean is written. A null plane, a size or window size below 1, or a
// plane over 2^31 - 1 bytes does nothing.
TFX_API void channelDenoise(unsigned char* plane, int width, int height, int windowSize,
                            float noise);
