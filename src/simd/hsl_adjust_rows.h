// The eight-band HSL adjustment on packed pixels from one buffer into another, for callers that
// would otherwise copy a frame and adjust it in place, and the vector kernel behind it.
#pragma once

#include <cstddef>
#include <cstdint>

#include "tessarofx/HSLAdjust.h"

namespace tfx {

// `count` packed BGRA pixels of `src` adjusted into `dst` (which may be `src`): the bytes that
// copying them and hslAdjustment on the copy give.
void HslAdjustInto(uint8_t* dst, const uint8_t* src, size_t count, const HSLBands& bands);

// The vector kernel behind both, on the instruction set Highway's dispatch picks at the call:
// `rows` rows of `count` packed 4-byte pixels from `src` into `dst` (which may be `src`), each
// `stride` bytes after the last; red is byte 0 in RGBA order (`rgba`), byte 2 otherwise. `table`
// holds, per hue step (1536, 256 per sextant), the hue shift in sextants, the chroma factor, the
// lightness before the grey fade and an unused float, 64-byte aligned.
void HslAdjustRows(uint8_t* dst, size_t dstStride, const uint8_t* src, size_t srcStride,
                   size_t rows, size_t count, const float* table, bool rgba);

// The name of the instruction set HslAdjustRows would run now.
const char* HslAdjustRowsTarget();

}  // namespace tfx
