// Row kernels of the detail and haze filters, compiled once per instruction set and picked at the
// time of each call (hwy::SetSupportedTargetsForTest included).
//
// Every kernel works on 4-byte pixels, rewrites bytes 0..2 and keeps byte 3, and gives the bytes
// of the plain per-pixel form beside its caller in enhance/: the same float and double
// expressions in the same order. Each result v becomes 0 below 0, else trunc(min(v, 255)).
#pragma once

#include <cstddef>
#include <cstdint>

namespace tfx {

// Haze removal: (c - L) / (1 - L / air), with L = min(dark[i], trunc(mean[i] * k)) and
// 0 <= k <= 0.9.
void HazeStretchRow(uint8_t* pixels, const uint8_t* dark, const uint8_t* mean, size_t count,
                    float k, float air);

// Destination pixel i from the 4-neighbour Laplacian around pixel i of `centre`, a row of a
// packed copy whose rows are `line` bytes apart: centre + lap * k. The caller points `dst` one
// pixel right of `centre`'s column.
void SharpenRow(const uint8_t* centre, ptrdiff_t line, uint8_t* dst, size_t count, float k);

// Unsharp mask: c + (c - blurred) * k.
void UnsharpRow(uint8_t* pixels, const uint8_t* blurred, size_t count, float k);

// The next `count` grain values of the ISO C reference generator, whose state `*state` carries
// from call to call: per pixel one value skipped, then
// float(sum of four * 5.28596089837e-05 - 3.46410161514 in double) * scale * 127.
void GrainNoise(uint32_t* state, float scale, float* noise, size_t count);

// c + noise[i], the same value on the three colour bytes of pixel i.
void AddGrainRow(uint8_t* pixels, const float* noise, size_t count);

// The name of the instruction set these rows would run on now.
const char* DetailRowsTarget();

}  // namespace tfx
