// Whether a CxImage header can be trusted before anything walks its buffer. A host builds
// wrapping headers from its own numbers, so a stride shorter than a row or a size that wrapped
// around its 32-bit field reaches this library as readily as a sound frame does.
#pragma once

#include <cstdint>

#include "tessarofx/CxImage.h"

namespace tfx {

// 8, 16, 24 or 32 bits per pixel, rows no shorter than the pixels they hold, and GetSize() equal
// to stride * height, all in 64 bits (a wrapped 32-bit product fails). Zero sizes pass: they
// describe no pixels.
inline bool HasConsistentLayout(const CxImage& image) {
  const uint32_t bpp = image.GetBpp();
  if (bpp != 8 && bpp != 16 && bpp != 24 && bpp != 32) return false;
  const uint64_t stride = image.GetEffWidth();
  return stride >= uint64_t{image.GetWidth()} * (bpp / 8) &&
         stride * image.GetHeight() == image.GetSize();
}

// An image with pixels that a row walk may cover in full: every pixel of every row lies within
// GetSize() bytes from GetBits().
inline bool IsSoundImage(const CxImage* image) {
  return image && image->GetBits() && image->GetWidth() > 0 && image->GetHeight() > 0 &&
         HasConsistentLayout(*image);
}

}  // namespace tfx
