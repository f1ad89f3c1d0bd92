// The 8-point DCT kernels behind the DCT denoiser, compiled once per instruction set and picked at
// run time (hwy::SetSupportedTargetsForTest included).
//
// Each transform here is one fixed butterfly on every instruction set: each output element is
// the same sequence of single-precision adds and multiplies whatever the vector width, so every
// target, the one-lane fallback included, gives the same bits.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tfx {

// The orthonormal DCT-II of 8 floats, or with `inverse` the DCT-III; `out` may be `in`.
void Dct8(const float* in, float* out, bool inverse);

// The 2-D transform of a row-major 8 x 8 block, rows first; `out` may be `in`.
void Dct8x8(const float* in, float* out, bool inverse);

// The forward transform down each column of a row-major 8 x 8 block; `out` may be `rows`.
void Dct8x8Columns(const float* rows, float* out);

// The scaled 8-point transforms the denoiser runs, with 5 multiplies instead of 22. Forward gives
// DctForwardGain(k) times the DCT-II's output k; inverse gives the DCT-III of its input k times
// 8 / DctForwardGain(k). Every target gives the same bits; `out` may be `in`.
void Dct8Scaled(const float* in, float* out, bool inverse);
double DctForwardGain(int k);

// The denoiser's thresholds for the scaled coefficient of column frequency j and row frequency
// k, at 8 k + j: `threshold` times both gains.
void DctScaledThresholds(float threshold, float out[64]);

// The sliding 8 x 8 hard-threshold denoiser of one plane: every block position is transformed,
// coefficients below `threshold` in magnitude are zeroed, and the inverse transforms covering a
// pixel are averaged. Writes only the pixels that blocks cover, rows below height - 8 and columns
// below width - 8; needs width and height of at least 9. Samples along a row are `step` bytes
// apart, rows `stride`; `dst` may be `src`. With `channels`, that many interleaved planes are
// denoised, starting at byte 0, 1, ... of each `step`; other bytes are neither read nor written.
// False when the scratch cannot be allocated, with nothing written.
bool DctDenoisePlane(const uint8_t* src, uint8_t* dst, int width, int height, ptrdiff_t stride,
                     float threshold, size_t step = 1, size_t channels = 1);

// The instruction set the kernels above would run now, as Highway names it.
const char* Dct8Target();

}  // namespace tfx
