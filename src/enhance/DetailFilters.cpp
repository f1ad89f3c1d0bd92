// Laplacian sharpening, unsharp-mask clarity and diffuse glow.
#include "tessarofx/DetailFilters.h"

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>

#include "enhance/DetailImage.h"
#include "simd/detail_rows.h"
#include "tessarofx/Blur.h"

namespace {

using tfx::ColourRows;
using tfx::FloatToByte;

// round4(width * pixel bytes): the row stride gaussianBlur expects.
size_t BlurStride(const ColourRows& rows) { return (rows.RowBytes() + 3) & ~size_t{3}; }

// Blurs in place the pixels of `scratch` (rows at BlurStride) with `radius`.
void Blur(const ColourRows& rows, uint8_t* scratch, int radius) {
  gaussianBlur(scratch, static_cast<int>(rows.width), static_cast<int>(rows.height),
               static_cast<int>(rows.pixelBytes), radius);
}

// A copy of the image's pixels at the stride gaussianBlur expects, or null when there is no
// memory or the sides do not fit its int arguments.
std::unique_ptr<uint8_t[]> BlurScratch(const ColourRows& rows) {
  if (rows.width > 2147483647u || rows.height > 2147483647u) return nullptr;
  const size_t stride = BlurStride(rows);
  std::unique_ptr<uint8_t[]> scratch(new (std::nothrow) uint8_t[stride * rows.height]);
  if (!scratch) return nullptr;
  for (size_t y = 0; y < rows.height; ++y) {
    std::memcpy(scratch.get() + y * stride, rows.Row(y), rows.RowBytes());
  }
  return scratch;
}

// UnsharpRow's per-pixel form, for 3-byte pixels.
void UnsharpRun3(uint8_t* pixels, const uint8_t* blurred, size_t count, float k) {
  for (size_t i = 0; i < count; ++i, pixels += 3, blurred += 3) {
    for (size_t j = 0; j < 3; ++j) {
      const int c = pixels[j];
      pixels[j] = FloatToByte(c + (c - blurred[j]) * k);
    }
  }
}

}  // namespace

CxImage* sharpen(CxImage* image, float amount) {
  if (!std::isfinite(amount) || amount == 0.0f) return image;
  ColourRows rows;
  // The source is addressed in 4-byte pixels, which 3-byte images do not have.
  if (!tfx::GetColourRows(image, &rows) || rows.pixelBytes != 4 || rows.width < 3 ||
      rows.height < 3) {
    return image;
  }
  const size_t rowBytes = rows.RowBytes();
  std::unique_ptr<uint8_t[]> copy(new (std::nothrow) uint8_t[rowBytes * rows.height]);
  if (!copy) return image;
  for (size_t y = 0; y < rows.height; ++y) {
    std::memcpy(copy.get() + y * rowBytes, rows.Row(y), rowBytes);
  }
  const float k = amount / 255.0f;
  // Each destination pixel takes the Laplacian centred one pixel to its left, so the interior
  // moves one pixel right. The packed copy makes the left neighbour of column 0 the last pixel of
  // the row above.
  for (size_t y = 1; y + 1 < rows.height; ++y) {
    tfx::SharpenRow(copy.get() + y * rowBytes, static_cast<ptrdiff_t>(rowBytes), rows.Row(y) + 4,
                    rows.width - 2, k);
  }
  return image;
}

CxImage* clarity(CxImage* image, float amount) {
  if (!std::isfinite(amount) || amount == 0.0f) return image;
  // Outside 2 < |amount| < 254 nothing is blurred, so copy - blurred is 0 and every value stays.
  const float magnitude = std::fabs(amount);
  if (!(magnitude > 2.0f && magnitude < 254.0f)) return image;
  ColourRows rows;
  if (!tfx::GetColourRows(image, &rows)) return image;
  // The image keeps the unblurred values until the end; the blur works on a copy.
  const std::unique_ptr<uint8_t[]> blurred = BlurScratch(rows);
  if (!blurred) return image;
  Blur(rows, blurred.get(), amount > 0.0f ? static_cast<int>(0.5f * amount) : 2);
  const float k = amount / 200.0f;
  const size_t stride = BlurStride(rows);
  for (size_t y = 0; y < rows.height; ++y) {
    if (rows.pixelBytes == 4) {
      tfx::UnsharpRow(rows.Row(y), blurred.get() + y * stride, rows.width, k);
    } else {
      UnsharpRun3(rows.Row(y), blurred.get() + y * stride, rows.width, k);
    }
  }
  return image;
}

CxImage* diffuse(CxImage* image, float amount) {
  if (!std::isfinite(amount) || amount == 0.0f) return image;
  ColourRows rows;
  if (!tfx::GetColourRows(image, &rows)) return image;
  // 1 + |sin(pi a / 1440)|, written as the cosine it is computed from: double, then one rounding
  // to float.
  constexpr double kPi = 3.14159265358979323846;
  const float gain =
      static_cast<float>(std::fabs(std::cos(-kPi * amount / 1440.0 + kPi / 2.0)) + 1.0);
  uint8_t table[256];
  for (int v = 0; v < 256; ++v) table[v] = FloatToByte(static_cast<float>(v) * gain);
  if (amount < 0.0f) {
    tfx::ApplyColourTable(rows, table);
    return image;
  }
  // Rows at the blur's own stride are brightened and blurred in place; others in a copy.
  const bool inPlace =
      rows.stride == BlurStride(rows) && rows.width <= 2147483647u && rows.height <= 2147483647u;
  std::unique_ptr<uint8_t[]> scratch;
  if (!inPlace) {
    scratch = BlurScratch(rows);
    if (!scratch) return image;
  }
  const ColourRows target = inPlace ? rows
                                    : ColourRows{scratch.get(), rows.width, rows.height,
                                                 rows.pixelBytes, BlurStride(rows)};
  tfx::ApplyColourTable(target, table);
  Blur(rows, target.bits, 1);
  if (!inPlace) {
    for (size_t y = 0; y < rows.height; ++y) {
      std::memcpy(rows.Row(y), target.Row(y), rows.RowBytes());
    }
  }
  return image;
}
