// The percentile filter's row: the window histogram slid along the row and scanned at each pixel,
// one instruction set per build of the kernel, picked at the time of the call.
#pragma once

#include <cstdint>

namespace tfx {

// Writes one row of fastFilter's output. `columns` holds `width` histograms of 256 8-bit
// counters, column x's over the window rows at x * 256; `rows` is the number of window rows.
// The window histogram is the wrapping total of the columns the defined walk has added and not
// yet removed at each x, scanned for the smallest value whose running count reaches the target
// of `fraction` (0..1); when none does the output is 0.
void WindowHistogramRow(const uint8_t* columns, uint8_t* out, int64_t width, int64_t radius,
                        int64_t rows, float fraction);

// The name of the instruction set WindowHistogramRow would run now.
const char* WindowHistogramTarget();

}  // namespace tfx
