// Monochrome grain: one noise value per pixel, added to its three colour bytes.
#include <cmath>
#include <cstddef>
#include <cstdint>

#include "enhance/DetailImage.h"
#include "simd/detail_rows.h"
#include "tessarofx/DetailFilters.h"

CxImage* addNoiseFilter(CxImage* image, float amount, float factor) {
  if (!std::isfinite(amount) || !std::isfinite(factor) || amount == 0.0f || factor == 0.0f) {
    return image;
  }
  tfx::ColourRows rows;
  if (!tfx::GetColourRows(image, &rows)) return image;
  const float s = (amount / 100.0f) * (factor / 100.0f);
  // The ISO C reference generator (values 0..32767), restarted from 0 on every call, so that
  // equal images get equal grain and calls on several threads share nothing.
  uint32_t state = 0;
  constexpr size_t kChunk = 1024;
  float noise[kChunk];
  tfx::ForEachRun(rows, [&](uint8_t* pixels, size_t count) {
    while (count > 0) {
      const size_t n = count < kChunk ? count : kChunk;
      tfx::GrainNoise(&state, s, noise, n);
      if (rows.pixelBytes == 4) {
        tfx::AddGrainRow(pixels, noise, n);
      } else {
        // AddGrainRow's per-pixel form.
        for (size_t i = 0; i < n; ++i) {
          for (size_t j = 0; j < 3; ++j) {
            pixels[3 * i + j] = tfx::FloatToByte(pixels[3 * i + j] + noise[i]);
          }
        }
      }
      pixels += n * rows.pixelBytes;
      count -= n;
    }
  });
  return image;
}
