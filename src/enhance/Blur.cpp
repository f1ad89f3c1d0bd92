// Stack Blur and the box blur over interleaved 8-bit pixels, in place.
#include "tessarofx/Blur.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>

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
    if (kChannels == 4) {
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
    if (kChannels == 4) {
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

// The row pass of the box blur: channel k of each row, its edge samples repeated, into byte k of
// kBlurred-byte pixels of `mid`. The window slides by one sample in and one out; in the middle of
// the row neither end is clamped.
template <int kBlurred>
void BoxRows(const uint8_t* pixels, int64_t w, int64_t h, ptrdiff_t channels, int64_t r,
             const BoxDivide& divide, uint8_t* mid) {
  const int64_t inside = std::min(r, w - 1);
  // Columns [r, w - r - 1) have both window ends inside the row.
  const int64_t middle_begin = std::min(r, w);
  const int64_t middle_end = std::max(middle_begin, w - r - 1);
  for (int64_t y = 0; y < h; ++y) {
    const uint8_t* row = pixels + y * w * channels;
    uint8_t* out = mid + y * w * kBlurred;
    for (int k = 0; k < kBlurred; ++k) {
      const uint8_t* p = row + k;
      uint64_t sum = static_cast<uint64_t>(r + 1) * p[0] + (r - inside) * p[(w - 1) * channels];
      for (int64_t i = 1; i <= inside; ++i) sum += p[i * channels];
      auto clamped_step = [&](int64_t x) {
        out[x * kBlurred + k] = divide(sum);
        sum += p[std::min(x + r + 1, w - 1) * channels];
        sum -= p[std::max<int64_t>(x - r, 0) * channels];
      };
      int64_t x = 0;
      for (; x < middle_begin; ++x) clamped_step(x);
      for (; x < middle_end; ++x) {
        out[x * kBlurred + k] = divide(sum);
        sum += p[(x + r + 1) * channels];
        sum -= p[(x - r) * channels];
      }
      for (; x < w; ++x) clamped_step(x);
    }
  }
}

// The column pass: each byte position of `mid`'s rows slides down the rows; only negative rows
// are clamped for the first window, which the height above the radius makes enough.
template <int kBlurred>
void BoxColumns(const uint8_t* mid, int64_t w, int64_t h, ptrdiff_t channels, int64_t r,
                const BoxDivide& divide, uint8_t* pixels, uint8_t* out_row, void* sums_block) {
  const size_t lanes = static_cast<size_t>(w * kBlurred);
  auto mid_row = [&](int64_t y) { return mid + y * static_cast<int64_t>(lanes); };
  auto output = [&](int64_t y) {
    return kBlurred == channels ? pixels + y * w * channels : out_row;
  };
  auto scatter = [&](int64_t y) {
    if (kBlurred == channels) return;
    uint8_t* row = pixels + y * w * channels;
    for (int64_t x = 0; x < w; ++x) row[x * channels] = out_row[x];
  };
  if (divide.by_multiply) {
    auto* sums = static_cast<uint32_t*>(sums_block);
    std::fill(sums, sums + lanes, 0u);
    tfx::BoxRowAccumulate(sums, mid_row(0), lanes, static_cast<uint32_t>(r + 1));
    for (int64_t i = 1; i <= r; ++i) tfx::BoxRowAccumulate(sums, mid_row(i), lanes, 1);
    for (int64_t y = 0; y < h; ++y) {
      tfx::BoxRowStep(sums, mid_row(std::min(y + r + 1, h - 1)),
                      mid_row(std::max<int64_t>(y - r, 0)), output(y), lanes, divide.quotient);
      scatter(y);
    }
    return;
  }
  auto* sums = static_cast<uint64_t*>(sums_block);
  for (size_t j = 0; j < lanes; ++j) sums[j] = static_cast<uint64_t>(r + 1) * mid_row(0)[j];
  for (int64_t i = 1; i <= r; ++i) {
    for (size_t j = 0; j < lanes; ++j) sums[j] += mid_row(i)[j];
  }
  for (int64_t y = 0; y < h; ++y) {
    const uint8_t* entering = mid_row(std::min(y + r + 1, h - 1));
    const uint8_t* leaving = mid_row(std::max<int64_t>(y - r, 0));
    uint8_t* out = output(y);
    for (size_t j = 0; j < lanes; ++j) {
      out[j] = divide(sums[j]);
      sums[j] += entering[j];
      sums[j] -= leaving[j];
    }
    scatter(y);
  }
}

template <int kBlurred>
void BoxBlur(uint8_t* pixels, int width, int height, int channels, int radius) {
  const int64_t w = width, h = height, r = radius;
  const BoxDivide divide(static_cast<uint64_t>(2 * r + 1));
  const size_t lanes = static_cast<size_t>(w * kBlurred);
  const size_t mid_bytes = lanes * static_cast<size_t>(h);
  const size_t sum_bytes = lanes * sizeof(uint64_t);
  const ScratchBlock scratch(sum_bytes + mid_bytes + static_cast<size_t>(w));
  if (!scratch) return;
  void* sums = scratch.As<void>();
  uint8_t* mid = scratch.As<uint8_t>(sum_bytes);
  uint8_t* out_row = scratch.As<uint8_t>(sum_bytes + mid_bytes);
  BoxRows<kBlurred>(pixels, w, h, channels, r, divide, mid);
  BoxColumns<kBlurred>(mid, w, h, channels, r, divide, pixels, out_row, sums);
}

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
    BoxBlur<3>(pixels, width, height, channels, radius);
  } else {
    // With 4 channels only byte 0 is blurred, as with 2 or more than 4.
    BoxBlur<1>(pixels, width, height, channels, radius);
  }
}
