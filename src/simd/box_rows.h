// Rows of the box blur's column pass, one instruction set per build of the kernels, picked at the
// time of the call. Each lane is one byte position of a row; enhance/Blur.cpp walks the rows.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tfx {

// floor(n / div) as (n * mul) >> shift, exact and within 32 bits for every n up to 255 div; such
// a pair exists for div up to 256.
struct BoxQuotient {
  uint32_t mul;
  int shift;
};

// sums[j] += weight * row[j] for j < lanes.
void BoxRowAccumulate(uint32_t* sums, const uint8_t* row, size_t lanes, uint32_t weight);

// out[j] = floor(sums[j] / div), then sums[j] += entering[j] - leaving[j] for j < lanes.
void BoxRowStep(uint32_t* sums, const uint8_t* entering, const uint8_t* leaving, uint8_t* out,
                size_t lanes, BoxQuotient quotient);

// out[j] = floor((running[j + span] - running[j]) / div) for j < lanes, the differences taken
// modulo 2^32: running totals may wrap, the window sums between them do not.
void BoxRowDifference(const uint32_t* running, size_t span, uint8_t* out, size_t lanes,
                      BoxQuotient quotient);

// out[j] = floor((row[j] + row[j + pitch] + ... + row[j + (taps - 1) pitch]) / taps) for
// j < lanes, with 2 to 15 taps: the window sums stay below 2^16 and divide by a 16-bit
// multiply-high. `pairs` holds lanes + (taps - 1) pitch scratch entries; `out` may not overlap
// `row`.
void BoxRowWindow(const uint8_t* row, size_t pitch, size_t taps, uint8_t* out, size_t lanes,
                  uint16_t* pairs);

// BoxRowStep with 16-bit sums for the windows of BoxRowWindow: out[j] = floor(sums[j] / taps),
// then sums[j] += entering[j] - leaving[j] for j < lanes, with 2 to 15 taps.
void BoxRowStep16(uint16_t* sums, const uint8_t* entering, const uint8_t* leaving, uint8_t* out,
                  size_t lanes, size_t taps);

// The name of the instruction set these rows would run on now.
const char* BoxRowsTarget();

}  // namespace tfx
