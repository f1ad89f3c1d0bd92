// Mean, variance and percentile of the square window around each pixel of one 8-bit plane.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "tessarofx/Blur.h"

namespace {

// Checks shared by the three filters: false when there is nothing to do. Radius below 1 copies.
bool Prepare(const unsigned char* src, unsigned char* dst, int width, int height, int radius) {
  if (src == nullptr || dst == nullptr || width < 1 || height < 1) return false;
  // Planes over 2^31 - 1 bytes are refused, as the blurs refuse such buffers.
  const uint64_t area = static_cast<uint64_t>(width) * static_cast<uint64_t>(height);
  if (area > INT32_MAX) return false;
  if (radius < 1) {
    std::memmove(dst, src, area);
    return false;
  }
  return true;
}

// The window of one output pixel, clipped to the plane. The walk adds the column at the right
// edge as the window slides, but not when that edge is clamped to the last column and the window
// is narrower than 2 radius + 1: on planes of radius + 2 to 2 radius columns the last column then
// never enters the sum although it is counted. That is the defined result.
struct Window {
  int64_t left, right, top, bottom;

  int64_t Count() const { return (right - left + 1) * (bottom - top + 1); }
};

template <class Statistic>
void WalkWindows(const uint8_t* src, uint8_t* dst, int width, int height, int radius,
                 Statistic& statistic) {
  const int64_t w = width, h = height, r = radius;
  for (int64_t y = 0; y < h; ++y) {
    Window win{0, 0, std::max<int64_t>(0, y - r), std::min(h - 1, y + r)};
    for (int64_t x = 0; x < w; ++x) {
      win.left = std::max<int64_t>(0, x - r);
      win.right = std::min(w - 1, x + r);
      if (x == 0) {
        statistic.Clear();
        for (int64_t i = win.left; i <= win.right; ++i) {
          statistic.AddColumn(src, w, i, win.top, win.bottom, 1);
        }
      } else {
        if (x - r > 0) statistic.AddColumn(src, w, x - r - 1, win.top, win.bottom, -1);
        if (!(win.right == w - 1 && win.right - win.left < 2 * r)) {
          statistic.AddColumn(src, w, win.right, win.top, win.bottom, 1);
        }
      }
      dst[y * w + x] = statistic.Value(win.Count());
    }
  }
}

struct MeanAndVariance {
  uint64_t sum = 0, sumsq = 0;

  void Clear() { sum = sumsq = 0; }
  void AddColumn(const uint8_t* src, int64_t w, int64_t x, int64_t top, int64_t bottom, int sign) {
    for (int64_t y = top; y <= bottom; ++y) {
      const uint64_t v = src[y * w + x];
      if (sign > 0) {
        sum += v;
        sumsq += v * v;
      } else {
        sum -= v;
        sumsq -= v * v;
      }
    }
  }
};

struct Mean : MeanAndVariance {
  uint8_t Value(int64_t count) const {
    return static_cast<uint8_t>(sum / static_cast<uint64_t>(count));
  }
};

struct Variance : MeanAndVariance {
  // The low byte, not a clamp: callers rely on variances above 255 wrapping.
  uint8_t Value(int64_t count) const {
    const uint64_t n = static_cast<uint64_t>(count);
    return static_cast<uint8_t>((sumsq - sum * sum / n) / n);
  }
};

struct Percentile {
  float fraction;
  uint8_t bins[256] = {};

  void Clear() { std::memset(bins, 0, sizeof bins); }
  void AddColumn(const uint8_t* src, int64_t w, int64_t x, int64_t top, int64_t bottom, int sign) {
    for (int64_t y = top; y <= bottom; ++y) bins[src[y * w + x]] += static_cast<uint8_t>(sign);
  }
  uint8_t Value(int64_t count) const {
    const int64_t target =
        std::min(static_cast<int64_t>(static_cast<float>(count + 1) * fraction), count);
    // 256 counters of at most 255 never total more than this; a larger target finds no bin.
    const int scan_target = static_cast<int>(std::min<int64_t>(target, 256 * 255 + 1));
    // No qualifying bin gives 256, whose low byte is stored.
    return static_cast<uint8_t>(calFilterValue(bins, 256, scan_target));
  }
};

}  // namespace

void fastWindowAverageFilter(const unsigned char* src, unsigned char* dst, int width, int height,
                             int radius) {
  if (!Prepare(src, dst, width, height, radius)) return;
  Mean mean;
  WalkWindows(src, dst, width, height, radius, mean);
}

void fastWindowVarianceFilter(const unsigned char* src, unsigned char* dst, int width, int height,
                              int radius) {
  if (!Prepare(src, dst, width, height, radius)) return;
  Variance variance;
  WalkWindows(src, dst, width, height, radius, variance);
}

void fastFilter(const unsigned char* src, unsigned char* dst, int width, int height, int radius,
                float percentile) {
  if (!Prepare(src, dst, width, height, radius)) return;
  // NaN counts as 0.
  Percentile filter{percentile > 0.0f ? std::min(percentile, 1.0f) : 0.0f};
  WalkWindows(src, dst, width, height, radius, filter);
}

int calFilterValue(const unsigned char* histogram, int bins, int target) {
  if (histogram == nullptr || bins < 1) return 0;
  int64_t total = 0;
  for (int v = 0; v < bins; ++v) {
    total += histogram[v];
    if (histogram[v] != 0 && total >= target) return v;
  }
  return bins;
}
