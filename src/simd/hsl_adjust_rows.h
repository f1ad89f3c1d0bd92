// The eight-band HSL adjustment on packed pixels from one buffer into another, for callers that
// would otherwise copy a frame and adjust it in place.
#pragma once

#include <cstddef>
#include <cstdint>

#include "tessarofx/HSLAdjust.h"

namespace tfx {

// `count` packed BGRA pixels of `src` adjusted into `dst` (which may be `src`): the bytes that
// copying them and hslAdjustment on the copy give.
void HslAdjustInto(uint8_t* dst, const uint8_t* src, size_t count, const HSLBands& bands);

}  // namespace tfx
