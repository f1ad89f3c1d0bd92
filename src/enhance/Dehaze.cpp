// Haze removal and addition with a dark-channel estimate, and its two planes.
//
// Removal estimates the haze of every pixel as the smaller of its dark channel and a scaled
// 15 x 15 mean of that channel, then stretches each colour away from it; addition lifts every
// value towards white. The arithmetic is float, as the strength is.
#include <algorithm>
#include <climits>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <new>

#include "base/ByteLimits.h"
#include "enhance/DetailImage.h"
#include "simd/detail_rows.h"
#include "tessarofx/Blur.h"
#include "tessarofx/DetailFilters.h"

namespace {

using tfx::ColourRows;

struct DarkStats {
  uint8_t maxRGB = 0;   // the largest per-pixel maximum
  uint8_t maxDark = 0;  // the largest per-pixel minimum
  uint64_t sum = 0;     // of the plane
};

template <size_t kPixelBytes>
void DarkRun(const uint8_t* pixels, size_t count, uint8_t* dark, DarkStats* stats) {
  uint8_t maxRGB = stats->maxRGB, maxDark = stats->maxDark;
  uint64_t sum = 0;
  for (size_t i = 0; i < count; ++i, pixels += kPixelBytes) {
    const uint8_t hi = std::max(std::max(pixels[0], pixels[1]), pixels[2]);
    const uint8_t lo = std::min(std::min(pixels[0], pixels[1]), pixels[2]);
    dark[i] = lo;
    maxRGB = std::max(maxRGB, hi);
    maxDark = std::max(maxDark, lo);
    sum += lo;
  }
  stats->maxRGB = maxRGB;
  stats->maxDark = maxDark;
  stats->sum += sum;
}

// The dark channel of every pixel into `dark` (width * height bytes, row after row).
DarkStats DarkChannel(const ColourRows& rows, uint8_t* dark) {
  DarkStats stats;
  uint8_t* out = dark;
  tfx::ForEachRun(rows, [&](const uint8_t* pixels, size_t count) {
    if (rows.pixelBytes == 4) {
      DarkRun<4>(pixels, count, out, &stats);
    } else {
      DarkRun<3>(pixels, count, out, &stats);
    }
    out += count;
  });
  return stats;
}

// byte(trunc(v)): the low byte of v truncated to 32 bits; values past 32 bits (and NaN) give 0,
// as a hardware conversion's out-of-range result INT_MIN does.
uint8_t LowByteOfTrunc(float v) {
  if (!(v >= -2147483648.0f && v < 2147483648.0f)) return 0;
  return static_cast<uint8_t>(static_cast<uint32_t>(static_cast<int32_t>(v)));
}

// byte(trunc(m * factor)) for every mean m.
void ScaledMeans(float factor, uint8_t table[256]) {
  for (int m = 0; m < 256; ++m) table[m] = LowByteOfTrunc(static_cast<float>(m) * factor);
}

// t < 0 lifts every value towards white: (v - 255 t') / (1 - t'), where t' = y / height + t and
// the row term, an integer division, is 0 on every row.
void AddHaze(const ColourRows& rows, float t) {
  uint8_t table[256];
  for (int v = 0; v < 256; ++v) {
    const float value = (static_cast<float>(v) - 255.0f * t) / (1.0f - t);
    // Rounding can leave 255 a hair below itself; a lift never darkens.
    table[v] = std::max(static_cast<uint8_t>(v), tfx::FloatToByte(value));
  }
  tfx::ApplyColourTable(rows, table);
}

// HazeStretchRow's per-pixel form, for 3-byte pixels.
void StretchRun3(uint8_t* pixels, size_t count, const uint8_t* dark, const uint8_t* mean, float k,
                 float air) {
  for (size_t i = 0; i < count; ++i, pixels += 3) {
    const int scaled = static_cast<int>(static_cast<float>(mean[i]) * k);
    const int level = std::min<int>(dark[i], scaled);
    const float gain = 1.0f - static_cast<float>(level) / air;
    for (size_t j = 0; j < 3; ++j) {
      pixels[j] = tfx::FloatToByte(static_cast<float>(pixels[j] - level) / gain);
    }
  }
}

void RemoveHaze(const ColourRows& rows, float t) {
  const size_t count = rows.width * rows.height;
  // The window filter takes int sizes and refuses planes past 2^31 - 1 bytes.
  if (count > 2147483647u) return;
  std::unique_ptr<uint8_t[]> dark(new (std::nothrow) uint8_t[count]);
  std::unique_ptr<uint8_t[]> mean(new (std::nothrow) uint8_t[count]);
  if (!dark || !mean) return;
  const DarkStats stats = DarkChannel(rows, dark.get());
  // A black image has no haze to remove (and would make the air light 0).
  if (stats.maxRGB == 0) return;
  fastWindowAverageFilter(dark.get(), mean.get(), static_cast<int>(rows.width),
                          static_cast<int>(rows.height), 7);

  const float mav = static_cast<float>(stats.sum / count);
  const float k = std::min(t * 1.6f * mav / 255.0f, 0.9f);
  // The air light: the largest mean (the scan stops once it meets 255, which nothing exceeds)
  // and the brightest colour byte, averaged. k <= 0.9 keeps every haze level L below it.
  uint8_t top = 0;
  for (size_t block = 0; block < count && top < 255; block += 4096) {
    const size_t end = std::min(count, block + 4096);
    for (size_t i = block; i < end; ++i) top = std::max(top, mean[i]);
  }
  const float air = 0.5f * static_cast<float>(top + stats.maxRGB);
  const uint8_t* d = dark.get();
  const uint8_t* m = mean.get();
  tfx::ForEachRun(rows, [&](uint8_t* pixels, size_t n) {
    if (rows.pixelBytes == 4) {
      tfx::HazeStretchRow(pixels, d, m, n, k, air);
    } else {
      StretchRun3(pixels, n, d, m, k, air);
    }
    d += n;
    m += n;
  });
}

}  // namespace

CxImage* dehaze(CxImage* image, float strength) {
  if (!std::isfinite(strength) || strength == 0.0f) return image;
  ColourRows rows;
  if (!tfx::GetColourRows(image, &rows)) return image;
  const float t = strength / 100.0f;
  if (strength < 0.0f) {
    AddHaze(rows, t);
  } else {
    RemoveHaze(rows, t);
  }
  return image;
}

unsigned char* getMinDarkChannel(CxImage* image, uint32_t* maxRGB, uint32_t* maxDark) {
  if (maxRGB) *maxRGB = 0;
  if (maxDark) *maxDark = 0;
  ColourRows rows;
  if (!tfx::GetColourRows(image, &rows)) return nullptr;
  uint8_t* dark = new (std::nothrow) uint8_t[rows.width * rows.height];
  if (!dark) return nullptr;
  const DarkStats stats = DarkChannel(rows, dark);
  if (maxRGB) *maxRGB = stats.maxRGB;
  if (maxDark) *maxDark = stats.maxDark;
  return dark;
}

unsigned char* calL(const unsigned char* dark, const unsigned char* mean, int width, int height,
                    float factor) {
  if (!dark || !mean || width < 1 || height < 1) return nullptr;
  const size_t count = static_cast<size_t>(width) * static_cast<size_t>(height);
  if (!tfx::FitsInt(width, height, 1)) return nullptr;
  uint8_t* out = new (std::nothrow) uint8_t[count];
  if (!out) return nullptr;
  uint8_t scaled[256];
  ScaledMeans(factor, scaled);
  for (size_t i = 0; i < count; ++i) out[i] = std::min(dark[i], scaled[mean[i]]);
  return out;
}
