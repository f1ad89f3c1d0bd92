// Stack Blur and the box blur over interleaved 8-bit pixels, in place.
#include "tessarofx/Blur.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <type_traits>

#include "enhance/Scratch.h"
#include "simd/box_rows.h"
#include "simd/stackblur_lanes.h"

// Literal constants rather than a table built at load: a host reads them as data.
const uint16_t stackblur_mul[256] = {
    512, 512, 456, 512, 328, 456, 335, 512, 405, 328, 271, 456, 388, 335, 292, 512, 454, 405, 364,
    328, 298, 271, 496, 456, 420, 388, 360, 335, 312, 292, 273, 512, 482, 454, 428, 405, 383, 364,
    345, 328, 312, 298, 284, 271, 259, 496, 475, 456, 437, 420, 404, 388, 374, 360, 347, 335, 323,
    312, 302, 292, 282, 273, 265, 512, 497, 482, 468, 454, 441, 428, 417, 405, 394, 383, 373, 364,
    354, 345, 337, 328, 320, 312, 305, 298, 291, 284, 278, 271, 265, 259, 507, 496, 485, 475, 465,
    456, 446, 437, 428, 420, 412, 404, 396, 388, 381, 374, 367, 360, 354, 347, 341, 335, 329, 323,
    318, 312, 307, 302, 297, 292, 287, 282, 278, 273, 269, 265, 261, 512, 505, 497, 489, 482, 475,
    468, 461, 454, 447, 441, 435, 428, 422, 417, 411, 405, 399, 394, 389, 383, 378, 373, 368, 364,
    359, 354, 350, 345, 341, 337, 332, 328, 324, 320, 316, 312, 309, 305, 301, 298, 294, 291, 287,
    284, 281, 278, 274, 271, 268, 265, 262, 259, 257, 507, 501, 496, 491, 485, 480, 475, 470, 465,
    460, 456, 451, 446, 442, 437, 433, 428, 424, 420, 416, 412, 408, 404, 400, 396, 392, 388, 385,
    381, 377, 374, 370, 367, 363, 360, 357, 354, 350, 347, 344, 341, 338, 335, 332, 329, 326, 323,
    320, 318, 315, 312, 310, 307, 304, 302, 299, 297, 294, 292, 289, 287, 285, 282, 280, 278, 275,
    273, 271, 269, 267, 265, 263, 261, 259, 512,
};
const uint8_t stackblur_shr[256] = {
    9,  11, 12, 13, 13, 14, 14, 15, 15, 15, 15, 16, 16, 16, 16, 17, 17, 17, 17, 17, 17, 17, 18, 18,
    18, 18, 18, 18, 18, 18, 18, 19, 19, 19, 19, 19, 19, 19, 19, 19, 19, 19, 19, 19, 19, 20, 20, 20,
    20, 20, 20, 20, 20, 20, 20, 20, 20, 20, 20, 20, 20, 20, 20, 21, 21, 21, 21, 21, 21, 21, 21, 21,
    21, 21, 21, 21, 21, 21, 21, 21, 21, 21, 21, 21, 21, 21, 21, 21, 21, 21, 22, 22, 22, 22, 22, 22,
    22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22, 22,
    22, 22, 22, 22, 22, 22, 22, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23,
    23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23,
    23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 23, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24,
    24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24,
    24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24,
    24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 24, 25,
};

namespace {

using tfx::ScratchBlock;
using tfx::StackblurLanesVector;
using tfx::StackblurWalk;

// Larger buffers are refused: a size that large is far likelier a caller's overflow than a frame.
constexpr uint64_t kMaxBytes = INT32_MAX;

// The table entry with common factors of 2 taken out of mul and 2^shr, which changes no
// quotient: radius 255 becomes sum >> 16, and every product then fits 32 bits (255 (r + 1)^2
// times mul stays below 2^32 for the other radii).
StackblurWalk MakeWalk(unsigned radius, bool alpha) {
  StackblurWalk walk{radius, stackblur_mul[radius], stackblur_shr[radius], alpha};
  while (walk.shr > 0 && walk.mul % 2 == 0) {
    walk.mul /= 2;
    --walk.shr;
  }
  return walk;
}

// Pass 2: the lanes are the bytes of a row, taken in strips as wide as the sums and the ring
// allow while staying in the second-level cache: whole rows read in order help the prefetcher
// most, but at large radii the ring of saved rows would crowd them out.
void BlurColumns(uint8_t* pixels, ptrdiff_t pitch, size_t row_bytes, size_t height,
                 const StackblurWalk& walk) {
  constexpr size_t kScratchBytes = 512 * 1024;
  const size_t bytes_per_lane = 3 * sizeof(uint32_t) + walk.radius + 1;
  const size_t strip = std::max<size_t>(256, kScratchBytes / bytes_per_lane / 64 * 64);
  const size_t lanes = std::min(strip, row_bytes);
  const ScratchBlock scratch(lanes * bytes_per_lane);
  if (!scratch) return;
  auto* sums = scratch.As<uint32_t>();
  auto* ring = reinterpret_cast<uint8_t*>(sums + 3 * lanes);
  for (size_t j = 0; j < row_bytes; j += strip) {
    StackblurLanesVector(pixels + j, pitch, std::min(strip, row_bytes - j), height, walk, sums,
                         ring);
  }
}

// Pass 1: bands of rows are turned so that each column of the band becomes a line of lanes,
// walked as the columns are, and turned back.
template <int kChannels>
void BlurRows(uint8_t* pixels, ptrdiff_t pitch, size_t width, size_t height,
              const StackblurWalk& walk) {
  constexpr size_t kBand = 32;
  constexpr size_t kLanes = (kBand * kChannels + 63) / 64 * 64;
  const ScratchBlock scratch(width * kLanes + kLanes * (3 * sizeof(uint32_t) + walk.radius + 1));
  if (!scratch) return;
  auto* sums = scratch.As<uint32_t>();
  auto* ring = reinterpret_cast<uint8_t*>(sums + 3 * kLanes);
  uint8_t* band = ring + kLanes * (walk.radius + 1);
  // Lanes past the band's rows are walked too; they only need defined contents.
  std::memset(band, 0, width * kLanes);
  for (size_t y0 = 0; y0 < height; y0 += kBand) {
    const size_t rows = std::min(kBand, height - y0);
    uint8_t* first_row = pixels + static_cast<ptrdiff_t>(y0) * pitch;
    if constexpr (kChannels == 4) {
      tfx::TurnPixels(first_row, pitch, band, kLanes, rows, width);
    } else {
      for (size_t i = 0; i < rows; ++i) {
        const uint8_t* row = first_row + static_cast<ptrdiff_t>(i) * pitch;
        for (size_t x = 0; x < width; ++x) {
          std::memcpy(band + x * kLanes + i * kChannels, row + x * kChannels, kChannels);
        }
      }
    }
    StackblurLanesVector(band, kLanes, kLanes, width, walk, sums, ring);
    if constexpr (kChannels == 4) {
      tfx::TurnPixels(band, kLanes, first_row, pitch, width, rows);
    } else {
      for (size_t i = 0; i < rows; ++i) {
        uint8_t* row = first_row + static_cast<ptrdiff_t>(i) * pitch;
        for (size_t x = 0; x < width; ++x) {
          std::memcpy(row + x * kChannels, band + x * kLanes + i * kChannels, kChannels);
        }
      }
    }
  }
}

// floor(n / div) for n up to 255 div: the 32-bit multiply and shift where one exists (div up
// to 256), else a division. With m = ceil(2^shift / div) and 2^shift >= 255 div^2 the product
// overshoots n / div by less than 1 / div, so it never reaches the next integer.
struct BoxDivide {
  tfx::BoxQuotient quotient{0, 0};
  uint64_t div;
  bool by_multiply = false;

  explicit BoxDivide(uint64_t d) : div(d) {
    if (d > 256) return;
    for (int shift = 0; shift < 32; ++shift) {
      const uint64_t power = uint64_t{1} << shift;
      if (power < 255 * d * d) continue;
      const uint64_t mul = (power + d - 1) / d;
      by_multiply = 255 * d * mul <= UINT32_MAX;
      quotient = {static_cast<uint32_t>(mul), shift};
      break;
    }
  }
  uint8_t operator()(uint64_t n) const {
    if (by_multiply) {
      return static_cast<uint8_t>((static_cast<uint32_t>(n) * quotient.mul) >> quotient.shift);
    }
    return static_cast<uint8_t>(n / div);
  }
};

// The box blur, a row of the row pass at a time: each column of the column pass slides down
// over rows of the row pass kept in a ring of 2 radius + 2, which holds every row between the
// one leaving the window and the one entering it. Row i of the row pass is made before output row
// i is written over its source, and only ever from rows not yet written.
template <int kBlurred>
class BoxBlur {
 public:
  // The largest radius whose windows BoxRowWindow sums directly.
  static constexpr int64_t kWindowRadius = 7;

  BoxBlur(uint8_t* pixels, int64_t w, int64_t h, int64_t channels, int64_t r)
      : pixels_(pixels),
        w_(w),
        h_(h),
        channels_(channels),
        r_(r),
        lanes_(static_cast<size_t>(w * kBlurred)),
        ring_rows_(std::min(h, 2 * r + 2)),
        divide_(static_cast<uint64_t>(2 * r + 1)) {}

  void Run() {
    // Column sums (32 or 64 bits), the running totals of one extended row, the ring and one
    // output row.
    const size_t sum_bytes = lanes_ * (divide_.by_multiply ? 4 : 8);
    const size_t running_bytes = static_cast<size_t>((w_ + 2 * r_ + 2) * kBlurred) * 4 + 64;
    const size_t ring_bytes = lanes_ * static_cast<size_t>(ring_rows_);
    const ScratchBlock scratch(sum_bytes + running_bytes + ring_bytes + static_cast<size_t>(w_));
    if (!scratch) return;
    running_ = scratch.As<uint32_t>(sum_bytes);
    ring_ = scratch.As<uint8_t>(sum_bytes + running_bytes);
    out_row_ = scratch.As<uint8_t>(sum_bytes + running_bytes + ring_bytes);
    if (r_ <= kWindowRadius) {
      Columns(scratch.As<uint16_t>());
    } else if (divide_.by_multiply) {
      Columns(scratch.As<uint32_t>());
    } else {
      Columns(scratch.As<uint64_t>());
    }
  }

 private:
  uint8_t* Row(int64_t y) const { return pixels_ + y * w_ * channels_; }
  uint8_t* Mid(int64_t y) const { return ring_ + static_cast<size_t>(y % ring_rows_) * lanes_; }

  // BoxRowWindow's pair sums, after the copy of an extended row in the running totals' room:
  // (w + 2 r) kBlurred bytes, aligned up to 64, and as many 16-bit sums fit in its
  // 4 (w + 2 r + 2) kBlurred + 64 bytes.
  uint16_t* Pairs() const {
    const size_t copy = static_cast<size_t>((w_ + 2 * r_) * kBlurred);
    return reinterpret_cast<uint16_t*>(reinterpret_cast<uint8_t*>(running_) +
                                       (copy + 63) / 64 * 64);
  }

  // Outputs [from, to) of a row of the row pass, from a copy of the samples their windows reach.
  void WindowsFromCopy(const uint8_t* row, uint8_t* mid, int64_t from, int64_t to) {
    auto* extended = reinterpret_cast<uint8_t*>(running_);
    uint8_t* p = extended;
    for (int64_t i = from - r_; i < to + r_; ++i, p += kBlurred) {
      std::memcpy(p, row + std::clamp<int64_t>(i, 0, w_ - 1) * channels_, kBlurred);
    }
    tfx::BoxRowWindow(extended, kBlurred, static_cast<size_t>(2 * r_ + 1), mid + from * kBlurred,
                      static_cast<size_t>((to - from) * kBlurred), Pairs());
  }

  // Row y of the row pass: channel k of each pixel, edge samples repeated, into byte k of
  // kBlurred-byte pixels.
  void MakeMid(int64_t y) {
    const uint8_t* row = Row(y);
    uint8_t* mid = Mid(y);
    if (r_ <= kWindowRadius) {
      // Small windows are summed tap by tap, a vector of outputs at once. Windows inside the row
      // read it where it lies; those reaching past an edge read a copy with the edge repeated.
      // The copies take 16 pixels more than the edges need, which the middle writes again,
      // so that they are wide enough for vectors.
      const int64_t edge = r_ + 16;
      if (kBlurred != channels_ || w_ <= 2 * edge) {
        WindowsFromCopy(row, mid, 0, w_);
        return;
      }
      WindowsFromCopy(row, mid, 0, edge);
      tfx::BoxRowWindow(row, kBlurred, static_cast<size_t>(2 * r_ + 1), mid + r_ * kBlurred,
                        static_cast<size_t>((w_ - 2 * r_) * kBlurred), Pairs());
      WindowsFromCopy(row, mid, w_ - edge, w_);
      return;
    }
    if (divide_.by_multiply) {
      // Running totals of the row extended by radius copies of its first pixel and radius + 1 of
      // its last: every window sum is then one difference, and a vector of them goes at once.
      uint32_t* total = running_;
      for (int k = 0; k < kBlurred; ++k) total[k] = 0;
      auto push = [&](const uint8_t* sample) {
        for (int k = 0; k < kBlurred; ++k) total[kBlurred + k] = total[k] + sample[k];
        total += kBlurred;
      };
      for (int64_t e = 0; e < r_; ++e) push(row);
      for (int64_t x = 0; x < w_; ++x) push(row + x * channels_);
      for (int64_t e = 0; e <= r_; ++e) push(row + (w_ - 1) * channels_);
      tfx::BoxRowDifference(running_, static_cast<size_t>((2 * r_ + 1) * kBlurred), mid, lanes_,
                            divide_.quotient);
      return;
    }
    // Large radii: the window slides by one sample in and one out.
    const int64_t inside = std::min(r_, w_ - 1);
    for (int k = 0; k < kBlurred; ++k) {
      const uint8_t* p = row + k;
      uint64_t sum = static_cast<uint64_t>(r_ + 1) * p[0] + (r_ - inside) * p[(w_ - 1) * channels_];
      for (int64_t i = 1; i <= inside; ++i) sum += p[i * channels_];
      for (int64_t x = 0; x < w_; ++x) {
        mid[x * kBlurred + k] = divide_(sum);
        sum += p[std::min(x + r_ + 1, w_ - 1) * channels_];
        sum -= p[std::max<int64_t>(x - r_, 0) * channels_];
      }
    }
  }

  // The column pass. The first window of a column reaches rows 0..radius, all below the height.
  // 16-bit sums go with the windows BoxRowWindow sums, 32-bit ones with the multiply-and-shift
  // quotient, 64-bit ones with a division.
  template <class Sum>
  void Columns(Sum* sums) {
    constexpr bool kByMultiply = std::is_same_v<Sum, uint32_t>;
    constexpr bool kSmall = std::is_same_v<Sum, uint16_t>;
    int64_t made = -1;  // the last row of the row pass made
    auto make_through = [&](int64_t y) {
      while (made < y) MakeMid(++made);
    };
    make_through(r_);
    std::fill(sums, sums + lanes_, Sum{0});
    for (int64_t i = 0; i <= r_; ++i) {
      const uint32_t weight = i == 0 ? static_cast<uint32_t>(r_ + 1) : 1;
      if constexpr (kByMultiply) {
        tfx::BoxRowAccumulate(sums, Mid(i), lanes_, weight);
      } else {
        for (size_t j = 0; j < lanes_; ++j) {
          sums[j] = static_cast<Sum>(sums[j] + static_cast<Sum>(weight) * Mid(i)[j]);
        }
      }
    }
    for (int64_t y = 0; y < h_; ++y) {
      const int64_t entering = std::min(y + r_ + 1, h_ - 1);
      make_through(entering);
      uint8_t* out = kBlurred == channels_ ? Row(y) : out_row_;
      if constexpr (kSmall) {
        tfx::BoxRowStep16(sums, Mid(entering), Mid(std::max<int64_t>(y - r_, 0)), out, lanes_,
                          static_cast<size_t>(2 * r_ + 1));
      } else if constexpr (kByMultiply) {
        tfx::BoxRowStep(sums, Mid(entering), Mid(std::max<int64_t>(y - r_, 0)), out, lanes_,
                        divide_.quotient);
      } else {
        const uint8_t* in = Mid(entering);
        const uint8_t* gone = Mid(std::max<int64_t>(y - r_, 0));
        for (size_t j = 0; j < lanes_; ++j) {
          out[j] = divide_(sums[j]);
          sums[j] += in[j];
          sums[j] -= gone[j];
        }
      }
      if (kBlurred != channels_) {
        uint8_t* row = Row(y);
        for (int64_t x = 0; x < w_; ++x) row[x * channels_] = out_row_[x];
      }
    }
  }

  uint8_t* pixels_;
  int64_t w_, h_, channels_, r_;
  size_t lanes_;
  int64_t ring_rows_;
  BoxDivide divide_;
  uint32_t* running_ = nullptr;
  uint8_t* ring_ = nullptr;
  uint8_t* out_row_ = nullptr;
};

}  // namespace

void stackblur(unsigned char* pixels, unsigned int width, unsigned int height, int channels,
               unsigned int radius, int pass) {
  if (pixels == nullptr || radius > 255 || channels < 1 || (pass != 1 && pass != 2)) return;
  if (width == 0 || height == 0) return;
  const uint64_t row_bytes = static_cast<uint64_t>(width) * static_cast<uint64_t>(channels);
  const uint64_t stride = (row_bytes + 3) & ~uint64_t{3};
  if (stride > kMaxBytes / height) return;
  const ptrdiff_t pitch = static_cast<ptrdiff_t>(stride);

  if (channels != 3 && channels != 4) {
    // The colour cap is 0, so every output is 0; pixels narrower than three bytes lose all
    // their bytes rather than spill into their neighbours and past the buffer.
    const size_t zeroed = static_cast<size_t>(std::min(channels, 3));
    for (unsigned y = 0; y < height; ++y) {
      uint8_t* p = pixels + static_cast<ptrdiff_t>(y) * pitch;
      for (unsigned x = 0; x < width; ++x, p += channels) std::memset(p, 0, zeroed);
    }
    return;
  }
  const StackblurWalk walk = MakeWalk(radius, channels == 4);
  if (pass == 2) {
    BlurColumns(pixels, pitch, static_cast<size_t>(row_bytes), height, walk);
  } else if (channels == 4) {
    BlurRows<4>(pixels, pitch, width, height, walk);
  } else {
    BlurRows<3>(pixels, pitch, width, height, walk);
  }
}

void gaussianBlur(unsigned char* pixels, int width, int height, int channels, int radius) {
  if (pixels == nullptr || static_cast<unsigned>(radius) - 1u >= 254u) return;
  if (width < 1 || height < 1) return;
  stackblur(pixels, static_cast<unsigned>(width), static_cast<unsigned>(height), channels,
            static_cast<unsigned>(radius), 1);
  stackblur(pixels, static_cast<unsigned>(width), static_cast<unsigned>(height), channels,
            static_cast<unsigned>(radius), 2);
}

void fastAverageBlur(unsigned char* pixels, int width, int height, int channels, int radius) {
  // The first window of a column reaches rows 0..radius unclamped, so the height must exceed
  // the radius.
  if (pixels == nullptr || radius < 1 || width < 1 || height <= radius || channels < 1) return;
  const uint64_t area = static_cast<uint64_t>(width) * static_cast<uint64_t>(height);
  if (area > kMaxBytes / static_cast<uint64_t>(channels)) return;
  if (channels == 3) {
    BoxBlur<3>(pixels, width, height, channels, radius).Run();
  } else {
    // With 4 channels only byte 0 is blurred, as with 2 or more than 4.
    BoxBlur<1>(pixels, width, height, channels, radius).Run();
  }
}
