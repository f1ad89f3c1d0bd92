// Tetrahedral application of a CubeLut lattice to rows of 8-bit pixels, and the byte conversions
// the lattice code shares. Internal to the plug-in.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tfx {

// What one application needs from a CubeLut: the 64-strided float lattice and the per-byte
// tables. `size` is N, already checked to be 1..64.
struct TetraTable {
  const float* lattice;  // [64][64][64][3]
  const float* ft;       // [256]
  const int32_t* gt;     // [256]
  int size;
};

// Float-to-int conversion as the x86 truncating instructions do it: toward zero, and the
// "integer indefinite" 0x80000000 for NaN and values outside int32, so hostile lattices give
// defined bytes. Only the low 8 bits are kept.
inline uint8_t TruncatedLowByte(double v) {
  if (!(v > -2147483649.0 && v < 2147483648.0)) return 0;
  return static_cast<uint8_t>(static_cast<int32_t>(v));
}

// One interpolated component to a byte: +0.5 and an upper clamp in double, no lower clamp, so a
// result below -0.5 wraps through its low 8 bits.
inline uint8_t LutComponentToByte(float v) {
  double w = static_cast<double>(v) + 0.5;
  if (w > 255.0) w = 255.0;  // NaN passes, as through std::min(w, 255.0)
  return TruncatedLowByte(w);
}

// Applies the table to `width` pixels of `bytesPerPixel` bytes (blue, green, red first) in place.
void TetraRow(const TetraTable& table, uint8_t* row, int width, int bytesPerPixel);

// The plain per-pixel formula, one comparison chain per pixel: the reference every fast path is
// held to.
void TetraRowReference(const TetraTable& table, uint8_t* row, int width, int bytesPerPixel);

}  // namespace tfx
