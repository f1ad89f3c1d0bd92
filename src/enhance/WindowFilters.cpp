// Mean, variance and percentile of the square window around each pixel of one 8-bit plane.
//
// The defined walk keeps one window sum (or histogram) per row and slides it a column at a time,
// adding and removing whole window columns. Here each column's part of the window is kept
// instead, updated by one row entering and one leaving as the window moves down, so every output
// costs the same whatever the radius. The window's value is then the total of the columns the
// walk would have added and not yet removed at that point: exact sums, or 8-bit counters that
// wrap the same way in any order of additions.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <new>

#include "enhance/Scratch.h"
#include "simd/window_histogram.h"
#include "tessarofx/Blur.h"

namespace {

using tfx::ScratchBlock;

__extension__ typedef unsigned __int128 Uint128;

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

// The columns of the window around column x: those counted, [left, right], and those summed,
// [left, summed_right]. The walk adds the column at the right edge as the window slides, but not
// when that edge is clamped to the last column and the window is narrower than 2 radius + 1; on
// planes of radius + 2 to 2 radius columns the last column thus never enters the sum once the
// window reaches it, although it is counted. That is the defined result.
struct ColumnSpan {
  int64_t left, right, summed_right;
};

ColumnSpan SpanAt(int64_t x, int64_t width, int64_t radius) {
  ColumnSpan span{std::max<int64_t>(0, x - radius), std::min(width - 1, x + radius), 0};
  const bool skips_last = width >= radius + 2 && width <= 2 * radius && x >= width - 1 - radius;
  span.summed_right = skips_last ? width - 2 : span.right;
  return span;
}

// floor(n / d) for every n up to a bound given when d is set, by a multiply and a shift: with
// m = ceil(2^k / d) and 2^k >= bound * d, n * m / 2^k exceeds n / d by less than 1 / d, which
// cannot reach the next integer. Divisors too large for a 64-bit m divide directly.
class Divider {
 public:
  void Set(uint64_t d, Uint128 bound) {
    d_ = d;
    const Uint128 product = bound * d;
    k_ = BitLength(product - 1);
    const Uint128 m = ((static_cast<Uint128>(1) << k_) + d - 1) / d;
    direct_ = k_ > 126 || (m >> 64) != 0;
    m_ = static_cast<uint64_t>(m);
  }
  uint64_t operator()(uint64_t n) const {
    if (direct_) return n / d_;
    return static_cast<uint64_t>((static_cast<Uint128>(n) * m_) >> k_);
  }

 private:
  static unsigned BitLength(Uint128 v) {
    const auto high = static_cast<uint64_t>(v >> 64), low = static_cast<uint64_t>(v);
    if (high != 0) return 128 - __builtin_clzll(high);
    return low != 0 ? 64 - __builtin_clzll(low) : 0;
  }

  uint64_t d_ = 1, m_ = 0;
  unsigned k_ = 0;
  bool direct_ = true;
};

// The divisors of one row, by the number of columns counted; rebuilt when the rows change.
class RowDividers {
 public:
  RowDividers(Divider* by_columns, int64_t max_columns, bool squares)
      : by_columns_(by_columns), max_columns_(max_columns), squares_(squares) {}

  void SetRows(int64_t rows) {
    if (rows == rows_) return;
    rows_ = rows;
    for (int64_t c = 1; c <= max_columns_; ++c) {
      const uint64_t count = static_cast<uint64_t>(c * rows);
      // Sums reach 255 count. Squared sums reach (255 count)^2, which is above 255^2 count,
      // wrapping past 2^64 as the 64-bit square does on the largest windows.
      const Uint128 square = static_cast<Uint128>(255 * count) * (255 * count);
      by_columns_[c].Set(count, squares_ ? std::min<Uint128>(square, UINT64_MAX) : 255 * count);
    }
  }
  const Divider& operator[](int64_t columns) const { return by_columns_[columns]; }

 private:
  Divider* by_columns_;
  int64_t max_columns_, rows_ = -1;
  bool squares_;
};

// Column sums over the window rows, moved down one row at a time, and their running totals along
// the row, from which each window's sum is one difference. `Sum` is 32 bits when every window
// total fits; the running totals may wrap, their differences do not.
template <class Sum, bool kSquares>
struct ColumnTotals {
  Sum* column;   // width entries
  Sum* running;  // width + 1 entries: running[x] is the total of columns 0..x - 1

  static Sum Term(uint8_t v) { return kSquares ? Sum{v} * v : Sum{v}; }

  void Start(const uint8_t* src, int64_t width, int64_t rows) {
    std::fill(column, column + width, Sum{0});
    for (int64_t y = 0; y < rows; ++y) Add(src + y * width, width);
  }
  void Add(const uint8_t* row, int64_t width) {
    for (int64_t x = 0; x < width; ++x) column[x] += Term(row[x]);
  }
  void Remove(const uint8_t* row, int64_t width) {
    for (int64_t x = 0; x < width; ++x) column[x] -= Term(row[x]);
  }
  void Move(const uint8_t* entering, const uint8_t* leaving, int64_t width) {
    for (int64_t x = 0; x < width; ++x) column[x] += Term(entering[x]) - Term(leaving[x]);
  }
  void Accumulate(int64_t width) {
    running[0] = 0;
    for (int64_t x = 0; x < width; ++x) running[x + 1] = running[x] + column[x];
  }
  uint64_t Window(const ColumnSpan& span) const {
    return static_cast<Sum>(running[span.summed_right + 1] - running[span.left]);
  }
};

// The rows of the window around row y: [top, bottom].
struct RowSpan {
  int64_t top, bottom;
};

RowSpan RowsAt(int64_t y, int64_t height, int64_t radius) {
  return {std::max<int64_t>(0, y - radius), std::min(height - 1, y + radius)};
}

// Moves the column totals from the window of row y - 1 to that of row y.
template <class Totals>
void MoveDown(Totals& totals, const uint8_t* src, int64_t y, int64_t width, int64_t height,
              int64_t radius) {
  const bool enters = y + radius <= height - 1, leaves = y - radius - 1 >= 0;
  // Row addresses are formed only for rows inside the plane: with a radius far beyond it they
  // would point billions of bytes away, past the ends of the address space.
  const auto row = [&](int64_t i) { return src + i * width; };
  if (enters && leaves) {
    totals.Move(row(y + radius), row(y - radius - 1), width);
  } else if (enters) {
    totals.Add(row(y + radius), width);
  } else if (leaves) {
    totals.Remove(row(y - radius - 1), width);
  }
}

template <class Sum, bool kVariance>
bool MeanOrVariance(const uint8_t* src, uint8_t* dst, int64_t w, int64_t h, int64_t r) {
  const int64_t max_columns = std::min(w, 2 * r + 1);
  const size_t sums = static_cast<size_t>(2 * w + 1) * sizeof(Sum);
  const ScratchBlock scratch(2 * sums + static_cast<size_t>(max_columns + 1) * sizeof(Divider));
  if (!scratch) return false;
  ColumnTotals<Sum, false> sum{scratch.As<Sum>(), scratch.As<Sum>(w * sizeof(Sum))};
  ColumnTotals<Sum, true> square{scratch.As<Sum>(sums), scratch.As<Sum>(sums + w * sizeof(Sum))};
  auto* dividers = scratch.As<Divider>(2 * sums);
  for (int64_t c = 0; c <= max_columns; ++c) new (dividers + c) Divider();
  RowDividers divide(dividers, max_columns, kVariance);

  const int64_t first_rows = std::min(h - 1, r) + 1;
  sum.Start(src, w, first_rows);
  if (kVariance) square.Start(src, w, first_rows);
  for (int64_t y = 0; y < h; ++y) {
    if (y > 0) {
      MoveDown(sum, src, y, w, h, r);
      if (kVariance) MoveDown(square, src, y, w, h, r);
    }
    const RowSpan rows = RowsAt(y, h, r);
    divide.SetRows(rows.bottom - rows.top + 1);
    sum.Accumulate(w);
    if (kVariance) square.Accumulate(w);
    uint8_t* out = dst + y * w;
    auto output = [&](int64_t x, const ColumnSpan& span, const Divider& by_count) {
      const uint64_t s = sum.Window(span);
      if (kVariance) {
        // The low byte, not a clamp: callers rely on variances above 255 wrapping.
        const uint64_t q = square.Window(span);
        out[x] = static_cast<uint8_t>(by_count(q - by_count(s * s)));
      } else {
        out[x] = static_cast<uint8_t>(by_count(s));
      }
    };
    // Columns radius .. width - radius - 1 have whole windows: 2 radius + 1 columns, all summed
    // (planes that skip a column are too narrow to have any).
    const int64_t middle_begin = std::min(r, w), middle_end = std::max(middle_begin, w - r);
    for (int64_t x = 0; x < middle_begin; ++x) {
      const ColumnSpan span = SpanAt(x, w, r);
      output(x, span, divide[span.right - span.left + 1]);
    }
    if (middle_begin < middle_end) {
      const Divider by_count = divide[2 * r + 1];
      for (int64_t x = middle_begin; x < middle_end; ++x) {
        output(x, ColumnSpan{x - r, x + r, x + r}, by_count);
      }
    }
    for (int64_t x = middle_end; x < w; ++x) {
      const ColumnSpan span = SpanAt(x, w, r);
      output(x, span, divide[span.right - span.left + 1]);
    }
  }
  return true;
}

template <bool kVariance>
void MeanOrVariance(const uint8_t* src, uint8_t* dst, int width, int height, int radius) {
  const int64_t w = width, h = height, r = radius;
  // 32-bit totals when no window can reach 2^32 (65025 times its pixel count, for squares).
  const uint64_t largest_window =
      static_cast<uint64_t>(std::min(w, 2 * r + 1)) * static_cast<uint64_t>(std::min(h, 2 * r + 1));
  if (largest_window * 65025 <= UINT32_MAX) {
    MeanOrVariance<uint32_t, kVariance>(src, dst, w, h, r);
  } else {
    MeanOrVariance<uint64_t, kVariance>(src, dst, w, h, r);
  }
}

}  // namespace

void fastWindowAverageFilter(const unsigned char* src, unsigned char* dst, int width, int height,
                             int radius) {
  if (!Prepare(src, dst, width, height, radius)) return;
  MeanOrVariance<false>(src, dst, width, height, radius);
}

void fastWindowVarianceFilter(const unsigned char* src, unsigned char* dst, int width, int height,
                              int radius) {
  if (!Prepare(src, dst, width, height, radius)) return;
  MeanOrVariance<true>(src, dst, width, height, radius);
}

void fastFilter(const unsigned char* src, unsigned char* dst, int width, int height, int radius,
                float percentile) {
  if (!Prepare(src, dst, width, height, radius)) return;
  // NaN counts as 0.
  const float fraction = percentile > 0.0f ? std::min(percentile, 1.0f) : 0.0f;
  const int64_t w = width, h = height, r = radius;
  // One 256-counter histogram per column of the window rows, moved down a row at a time.
  const ScratchBlock scratch(static_cast<size_t>(w) * 256);
  if (!scratch) return;
  uint8_t* columns = scratch.As<uint8_t>();
  std::memset(columns, 0, static_cast<size_t>(w) * 256);
  for (int64_t y = 0; y <= std::min(h - 1, r); ++y) {
    for (int64_t x = 0; x < w; ++x) ++columns[x * 256 + src[y * w + x]];
  }
  for (int64_t y = 0; y < h; ++y) {
    if (y > 0) {
      if (y + r <= h - 1) {
        for (int64_t x = 0; x < w; ++x) ++columns[x * 256 + src[(y + r) * w + x]];
      }
      if (y - r - 1 >= 0) {
        for (int64_t x = 0; x < w; ++x) --columns[x * 256 + src[(y - r - 1) * w + x]];
      }
    }
    const RowSpan rows = RowsAt(y, h, r);
    tfx::WindowHistogramRow(columns, dst + y * w, w, r, rows.bottom - rows.top + 1, fraction);
  }
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
