// Hue rotation of packed 4-byte pixels by the sequential 3 x 3 matrix, compiled once per
// instruction set and picked by Highway's dispatch at the call. Every set gives the bytes of the
// per-pixel rows in adjust/HueAdjust.cpp.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tfx {

// `count` consecutive 4-byte pixels in place (bytes 0..2 colour, byte 3 kept), by `m` row by
// row, each row using the channels the rows before it wrote; greys are left alone.
void RotatePixels(uint8_t* pixels, size_t count, const float m[9]);

// The name of the instruction set RotatePixels would run now.
const char* HueRotateTarget();

}  // namespace tfx
