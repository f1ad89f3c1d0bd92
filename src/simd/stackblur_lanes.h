// The Stack Blur walk run across many lines at once, one instruction set per build of the kernel,
// picked at the time of the call. Used by enhance/Blur.cpp for both passes: the column pass walks
// the image's rows, the row pass walks a transposed band of rows.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tfx {

struct StackblurWalk {
  unsigned radius;  // 0..255
  uint32_t mul;     // with `shr`, (sum * mul) >> shr fits 32 bits for every sum of the radius
  unsigned shr;
  bool alpha;  // 4-byte pixels: byte 3 caps bytes 0..2 and is kept
};

// Blurs each of the `lanes` byte positions of `count` lines (line i at first + i * stride) along
// the lines, in place: the byte of line i becomes the Stack Blur output at position i of that
// lane's sequence, exactly as the one-line walk gives it. With `alpha`, lanes come in pixels of
// four starting at `first`, and every fourth one is left as it is.
//
// `sums` holds 3 * lanes entries and `ring` (radius + 1) * lanes bytes; their contents on entry
// do not matter.
void StackblurLanesVector(uint8_t* first, ptrdiff_t stride, size_t lanes, size_t count,
                          const StackblurWalk& walk, uint32_t* sums, uint8_t* ring);

// Turns `rows` rows of `columns` 4-byte pixels (row r at src + r * src_pitch) into `columns` rows
// of `rows` pixels (row c at dst + c * dst_pitch): pixel c of source row r becomes pixel r of
// destination row c. Rows need no alignment.
void TurnPixels(const uint8_t* src, ptrdiff_t src_pitch, uint8_t* dst, ptrdiff_t dst_pitch,
                size_t rows, size_t columns);

// The name of the instruction set StackblurLanesVector would run now.
const char* StackblurLanesTarget();

}  // namespace tfx
