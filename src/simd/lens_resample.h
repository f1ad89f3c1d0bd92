// Row kernels behind distortion and fringing on packed 4-byte pixels, one set per instruction set
// compiled in, picked at run time. Every set gives the bytes of the per-pixel walks in
// adjust/LensAdjust.cpp, so callers may use any of them; tests run them all.
#pragma once

#include <cstddef>
#include <cstdint>

#include "adjust/LensMaps.h"

namespace tfx {

struct LensResampleRows {
  const char* name;  // the instruction set, as Highway names it
  // Pixel i of `dst` becomes the four bytes of `src` at byte offset map[i].y * rowBytes +
  // map[i].x when they lie within its `srcSize` bytes, else pixel i of `src`. Offsets stay within
  // int32_t: rowBytes <= 65535 and srcSize <= INT32_MAX, with count * 4 <= srcSize.
  void (*distort)(const LensPoint* map, size_t count, int32_t rowBytes, const uint8_t* src,
                  int32_t srcSize, uint8_t* dst);
  // `count` pixels of one row of `dst`: blue from the BGRA pixel of `src` at blue[x], red from the
  // one at red[x], green and alpha from the one at green[x]. Every point lies inside the frame,
  // whose last byte sits below offset INT32_MAX; `stride` is its row length in bytes.
  void (*fringe)(const LensPoint* blue, const LensPoint* green, const LensPoint* red, size_t count,
                 const uint8_t* src, int32_t stride, uint8_t* dst);
  // `count` pixels of `dst`: blue from the four bytes of `src` at byte offset blue[i], red from
  // those at red[i], green and alpha from those at green[i]. Every offset leaves four bytes.
  void (*fringeOffsets)(const int32_t* blue, const int32_t* green, const int32_t* red, size_t count,
                        const uint8_t* src, uint8_t* dst);
  // `count` pixels of `dst` from the blocks of a one-pass composite (see LensBlock) over a packed
  // frame `src` of `srcSize` bytes with rows of `rowBytes`: each pixel as fringeOffsets makes it
  // from the offsets its block codes, or from the block's offsets in `spill`.
  void (*fringeBlocks)(const LensBlock* blocks, size_t count, const int32_t* spill,
                       int32_t rowBytes, const uint8_t* src, int32_t srcSize, uint8_t* dst);
  // The blocks of a one-pass composite (see LensBlock) over a packed BGRA frame of `count`
  // pixels, `width` to a row: pixel i's plane takes the distortion's source (row y, byte x: the
  // offset y * width * 4 + x) at the point of that plane's fringing map. Blocks that need their
  // offsets spilled (sources past the windows, a distortion source outside the frame, the last
  // partial block) are marked with spill = -2 and otherwise left for the caller. Offsets stay
  // within int32_t: sides of at most 8191 pixels.
  void (*composeBlocks)(const LensPoint* blue, const LensPoint* green, const LensPoint* red,
                        const LensPoint* distort, size_t count, int32_t width, LensBlock* blocks);
  // The distortion map's step from the strength-independent values of each quadrant point
  // (radius r, power = r^e rounded to float, direction cosT, sinT) to its offset from the
  // centre, in float: rp = (power * k + r) * rescale, x = cosT * rp * nx, y = sinT * rp * ny.
  void (*distortOffsets)(const float* r, const float* power, const float* cosT, const float* sinT,
                         size_t count, const float scale[4], float* x, float* y);
  // One map row from a quadrant row of offsets (index |column - cx|): column x takes
  // -x[cx - column] left of cx, else x[column - cx]; y is negated when `above`. Each coordinate
  // is offset + centre in float, truncated to int (INT_MIN outside its range, NaN included),
  // and its low 16 bits stored.
  void (*assembleRow)(const float* x, const float* y, bool above, int width, int cx, float fcx,
                      float fcy, LensPoint* out);
};

// The set Highway's dispatch picks at the time of the call (hwy::SetSupportedTargetsForTest
// included).
const LensResampleRows& BestLensResampleRows();

}  // namespace tfx
