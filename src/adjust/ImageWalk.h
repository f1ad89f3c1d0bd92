// How the adjustment functions walk an image: packed 32-bit rows for the fast kernels, the
// per-pixel accessors for every other layout.
#pragma once

#include <cstddef>
#include <cstdint>

#include "image/ImageLayout.h"
#include "tessarofx/CxImage.h"

namespace tfx {

// Packed 4-byte pixels whose first three bytes are colour. Both orders qualify for operations
// that treat red, green and blue alike.
inline bool HasPackedColour(const CxImage& image) {
  return image.GetBits() && image.GetBpp() == 32 &&
         (image.getFormat() == IPF_BGRA || image.getFormat() == IPF_RGBA);
}

// Calls row(pixels, count) over the image's 4-byte pixels: once for an unpadded image, else
// once per row, so padding is never touched. The image must be sound (IsSoundImage).
template <class RowFn>
void ForEachRow(CxImage* image, RowFn row) {
  uint8_t* bits = image->GetBits();
  const size_t width = image->GetWidth();
  const size_t height = image->GetHeight();
  const size_t stride = image->GetEffWidth();
  if (stride == width * 4) {
    row(bits, width * height);
    return;
  }
  for (size_t y = 0; y < height; ++y) row(bits + y * stride, width);
}

// Replaces every pixel p by pixel(p) through the accessors (alpha read and written).
template <class PixelFn>
void ForEachPixel(CxImage* image, PixelFn pixel) {
  for (unsigned long y = 0; y < image->GetHeight(); ++y) {
    for (unsigned long x = 0; x < image->GetWidth(); ++x) {
      image->SetPixelColor(x, y, pixel(image->GetPixelColor(x, y, true)));
    }
  }
}

}  // namespace tfx
