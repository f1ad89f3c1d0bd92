// How the detail and haze filters see a CxImage: rows of 3- or 4-byte pixels whose first three
// bytes are colour, all inside the image's buffer.
#pragma once

#include <cstddef>
#include <cstdint>

#include "simd/color_adjust_rows.h"
#include "tessarofx/CxImage.h"

namespace tfx {

struct ColourRows {
  uint8_t* bits;
  size_t width;
  size_t height;
  size_t pixelBytes;  // 3 or 4
  size_t stride;      // bytes from one row to the next, at least width * pixelBytes

  uint8_t* Row(size_t y) const { return bits + y * stride; }
  size_t RowBytes() const { return width * pixelBytes; }
  // Rows follow each other without padding, so the image is one run of width * height pixels.
  bool Packed() const { return stride == RowBytes(); }
};

// False for a null or empty image, pixels of other than 24 or 32 bits (bytes 0..2 would reach
// into the next pixel), a stride shorter than a row, or rows that end past GetSize() (a wrapped
// header whose size wrapped around 32 bits).
inline bool GetColourRows(const CxImage* image, ColourRows* rows) {
  if (!image || !image->GetBits() || image->GetWidth() == 0 || image->GetHeight() == 0) {
    return false;
  }
  if (image->GetBpp() != 24 && image->GetBpp() != 32) return false;
  const size_t pixelBytes = image->GetBpp() / 8;
  const size_t width = image->GetWidth(), height = image->GetHeight();
  const size_t stride = image->GetEffWidth();
  if (stride < width * pixelBytes || stride * height > image->GetSize()) return false;
  *rows = {image->GetBits(), width, height, pixelBytes, stride};
  return true;
}

// Calls run(pixels, count) over every pixel in order: once for a packed image, else once a row,
// so row padding is never touched.
template <class RunFn>
void ForEachRun(const ColourRows& rows, RunFn run) {
  if (rows.Packed()) {
    run(rows.bits, rows.width * rows.height);
    return;
  }
  for (size_t y = 0; y < rows.height; ++y) run(rows.Row(y), rows.width);
}

// Bytes 0..2 of every pixel through `table`; any fourth byte is kept.
inline void ApplyColourTable(const ColourRows& rows, const uint8_t table[256]) {
  if (rows.pixelBytes == 4) {
    const ColorAdjustRows& kernels = BestColorAdjustRows();
    ForEachRun(rows, [&](uint8_t* pixels, size_t count) {
      kernels.applyTable(pixels, pixels, count, table);
    });
    return;
  }
  ForEachRun(rows, [&](uint8_t* pixels, size_t count) {
    for (size_t i = 0; i < count; ++i, pixels += 3) {
      pixels[0] = table[pixels[0]];
      pixels[1] = table[pixels[1]];
      pixels[2] = table[pixels[2]];
    }
  });
}

// 0 below 0 (and for NaN), else trunc(min(v, 255)).
inline uint8_t FloatToByte(float v) {
  if (!(v > 0.0f)) return 0;
  return static_cast<uint8_t>(v < 255.0f ? static_cast<int>(v) : 255);
}

}  // namespace tfx
