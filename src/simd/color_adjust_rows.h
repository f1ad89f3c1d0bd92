// Row kernels behind the colour adjustments, one set per instruction set compiled in, picked at
// run time. Every set gives the same bytes as the per-pixel forms in adjust/ColorAdjust.cpp, so
// callers may use any of them; tests run them all.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tfx {

// Exposure, brightness, contrast, vibrance and saturation in one pass, for settings where the tone
// curve and vibrance keep the order of a pixel's channels: then what vibrance and saturation
// derive from a pixel depends on its largest and smallest channel after the curve alone, and
// comes from tables indexed by largest * 256 + smallest (entries with smallest <= largest).
struct FusedColourTables {
  const uint8_t* tone;  // 256 entries, or null for none
  float strength;       // vibrance's, with 255 * |strength| below 2^15 (0: none)
  bool saturate;
  bool increase;  // sigma >= 0
  // The results of vibrance and saturation for the largest channel (bits 0..7) and the smallest
  // (bits 8..15), the sum of the two after vibrance (bits 16..31), and in bits 32..63 the bits of
  // saturation's a when increasing (0 for a grey, which keeps its channels).
  const uint64_t* ends;
  // The same a alone, at the same index: a quarter of the cache lines for a target that gathers
  // only it. Each of the two may be null where ColorAdjustRows::readsEnds says it is not read.
  const float* gains;
  // Saturation's 1 + sigma when decreasing.
  float fixedGain;
};

// Each kernel rewrites `count` consecutive 4-byte pixels in place: bytes 0..2 are colour (in
// either order: every operation treats the three channels alike), byte 3 is alpha and is kept.
// Rows need no particular alignment.
struct ColorAdjustRows {
  const char* name;  // the instruction set, as Highway names it
  // Bytes 0..2 of each pixel of `src` through the table into `dst`, which may be `src`.
  void (*applyTable)(uint8_t* dst, const uint8_t* src, size_t count, const uint8_t table[256]);
  // strength = v / 100 * 0.8
  void (*vibrance)(uint8_t* pixels, size_t count, float strength);
  // sigma = s / 100, not 0
  void (*saturation)(uint8_t* pixels, size_t count, float sigma);
  // Byte i of each pixel (i < 3) becomes 0 below 0, else trunc(min(255, byte * gain[i])), in
  // float; alpha is copied. `dst` may be `src`.
  void (*scaleChannels)(uint8_t* dst, const uint8_t* src, size_t count, const float gain[3]);
  // Each colour byte c of a pixel whose largest colour byte is m becomes table[m * 256 + c]. The
  // table is read four bytes at a time, so it holds kBrightestTableBytes. `dst` may be `src`.
  void (*brightestTable)(uint8_t* dst, const uint8_t* src, size_t count, const uint8_t* table);
  // `dst` may be `src`.
  void (*fusedColour)(uint8_t* dst, const uint8_t* src, size_t count,
                      const FusedColourTables& tables);
  // Whether fusedColour reads FusedColourTables::ends; if not, it reads gains alone, and only
  // when saturation increases.
  bool readsEnds;
};

inline constexpr size_t kBrightestTableBytes = 256 * 256 + 3;

// The set Highway's dispatch picks at the time of the call (hwy::SetSupportedTargetsForTest
// included).
const ColorAdjustRows& BestColorAdjustRows();

}  // namespace tfx
