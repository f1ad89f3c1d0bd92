// Rows of pixels to and from CxImage's integer HSL, one instruction set per build of the kernels,
// picked at the time of the call (hwy::SetSupportedTargetsForTest included). Every set gives the
// bytes of CxImage::RGBtoHSL and CxImage::HSLtoRGB.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tfx {

// The HSL of `count` pixels, `bytesPerPixel` (3 or 4) apart, red first when `redFirst` (else
// blue): hue, saturation and lightness into `count` bytes of each of their planes.
void RgbToHslRow(const uint8_t* pixels, size_t bytesPerPixel, bool redFirst, uint8_t* hue,
                 uint8_t* saturation, uint8_t* lightness, size_t count);

// The inverse: bytes 0..2 of each pixel from the three planes; a fourth byte is kept.
void HslToRgbRow(const uint8_t* hue, const uint8_t* saturation, const uint8_t* lightness,
                 uint8_t* pixels, size_t bytesPerPixel, bool redFirst, size_t count);

// The name of the instruction set the rows above would run now.
const char* HslRowsTarget();

}  // namespace tfx
