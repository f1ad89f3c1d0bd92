#include "tessarofx/Blur.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <iterator>
#include <utility>
#include <vector>

#include "support/EveryTarget.h"
#include "support/ImageBuilders.h"

namespace {

using tfx_test::NoiseBytes;

using Bytes = std::vector<uint8_t>;

int64_t Clamp(int64_t v, int64_t lo, int64_t hi) { return std::min(std::max(v, lo), hi); }

size_t StackblurStride(int width, int channels) { return (size_t(width) * channels + 3) & ~3u; }

// One Stack Blur pass as what the in-place line walk computes: each colour byte becomes the
// triangle-weighted sum of its line (edges repeated, samples as they were before the pass) times
// mul >> shr, capped by the pixel's alpha with 4 channels, else by 255.
void ReferenceStackblur(Bytes& image, int width, int height, int channels, int radius, int pass) {
  const Bytes in = image;
  const int64_t stride = StackblurStride(width, channels), r = radius;
  const int64_t length = pass == 1 ? width : height, lines = pass == 1 ? height : width;
  for (int64_t l = 0; l < lines; ++l) {
    auto at = [&](int64_t i) {
      return pass == 1 ? l * stride + i * channels : i * stride + l * channels;
    };
    for (int64_t i = 0; i < length; ++i) {
      for (int c = 0; c < 3; ++c) {
        uint64_t sum = 0;
        for (int64_t k = -r; k <= r; ++k) {
          sum += uint64_t(r + 1 - std::abs(k)) * in[at(Clamp(i + k, 0, length - 1)) + c];
        }
        const uint64_t limit = channels == 4 ? in[at(i) + 3] : 255;
        image[at(i) + c] = uint8_t(std::min((sum * stackblur_mul[r]) >> stackblur_shr[r], limit));
      }
    }
  }
}

// Box means of box means, edges repeated, each truncated.
Bytes BoxReference(const Bytes& in, int64_t w, int64_t h, int channels, int64_t radius) {
  Bytes out = in;
  std::vector<int64_t> rows(w * h);
  auto box = [&](auto sample, int64_t i, int64_t n) {
    int64_t sum = 0;
    for (int64_t k = -radius; k <= radius; ++k) sum += sample(Clamp(i + k, 0, n - 1));
    return sum / (2 * radius + 1);
  };
  for (int c = 0; c < (channels == 3 ? 3 : 1); ++c) {
    for (int64_t i = 0; i < w * h; ++i) {
      const int64_t y = i / w, x = i % w;
      rows[i] = box([&](int64_t k) { return in[(y * w + k) * channels + c]; }, x, w);
    }
    for (int64_t i = 0; i < w * h; ++i) {
      const int64_t y = i / w, x = i % w;
      out[i * channels + c] = uint8_t(box([&](int64_t k) { return rows[k * w + x]; }, y, h));
    }
  }
  return out;
}

// The window walk step by step as it is defined, including the right column it skips on narrow
// planes; `statistic` maps (window pixels as added, count) to the output byte.
enum class Stat { kMean, kVariance, kPercentile };

Bytes LiteralWindowWalk(const Bytes& src, int width, int height, int radius, Stat stat,
                        float percentile = 0.5f) {
  Bytes dst(src.size());
  const int64_t w = width, h = height, r = radius;
  for (int64_t y = 0; y < h; ++y) {
    const int64_t top = std::max<int64_t>(0, y - r), bottom = std::min(h - 1, y + r);
    uint64_t sum = 0, sumsq = 0;
    uint8_t bins[256] = {};
    auto column = [&](int64_t x, int sign) {
      for (int64_t yy = top; yy <= bottom; ++yy) {
        const uint64_t v = src[yy * w + x];
        sum += sign > 0 ? v : -v;
        sumsq += sign > 0 ? v * v : -(v * v);
        bins[v] = uint8_t(bins[v] + sign);
      }
    };
    for (int64_t x = 0; x < w; ++x) {
      const int64_t left = std::max<int64_t>(0, x - r), right = std::min(w - 1, x + r);
      if (x == 0) {
        for (int64_t i = left; i <= right; ++i) column(i, 1);
      } else {
        if (x - r > 0) column(x - r - 1, -1);
        if (!(right == w - 1 && right - left < 2 * r)) column(right, 1);
      }
      const uint64_t count = uint64_t((right - left + 1) * (bottom - top + 1));
      uint8_t value = 0;
      if (stat == Stat::kMean) value = uint8_t(sum / count);
      if (stat == Stat::kVariance) value = uint8_t((sumsq - sum * sum / count) / count);
      if (stat == Stat::kPercentile) {
        const float p = std::min(std::max(percentile, 0.0f), 1.0f);
        const int64_t target = std::min(int64_t(float(count + 1) * p), int64_t(count));
        int64_t total = 0;
        int v = 0;
        for (; v < 256; ++v) {
          total += bins[v];
          if (bins[v] != 0 && total >= target) break;
        }
        value = uint8_t(v);
      }
      dst[y * w + x] = value;
    }
  }
  return dst;
}

// ---- Stack Blur -------------------------------------------------------------------------------

TEST(StackblurTables, FollowTheirRuleAndPublishedSums) {
  uint32_t mul_sum = 0, shr_sum = 0;
  for (uint32_t r = 0; r < 256; ++r) {
    SCOPED_TRACE(r);
    const uint32_t area = (r + 1) * (r + 1);
    uint32_t log2 = 0;
    while ((area >> (log2 + 1)) != 0) ++log2;
    EXPECT_EQ(stackblur_shr[r], log2 + 9);
    EXPECT_EQ(stackblur_mul[r], ((1u << stackblur_shr[r]) + area - 1) / area);
    if (r < 255) {
      mul_sum += stackblur_mul[r];
      shr_sum += stackblur_shr[r];
    }
  }
  EXPECT_EQ(mul_sum, 93471u);
  EXPECT_EQ(shr_sum, 5516u);
  const uint16_t first_mul[] = {512, 512, 456, 512, 328, 456, 335, 512, 405, 328};
  const uint8_t first_shr[] = {9, 11, 12, 13, 13, 14, 14, 15, 15, 15};
  EXPECT_EQ(std::memcmp(stackblur_mul, first_mul, sizeof first_mul), 0);
  EXPECT_EQ(std::memcmp(stackblur_shr, first_shr, sizeof first_shr), 0);
}

TEST(Stackblur, EachPassMatchesItsDefinitionOnEveryTarget) {
  struct Case {
    int width, height, channels, radius;
  };
  // Lines shorter than the radius, single pixels, rows padded to 4 bytes, lanes past whole
  // vectors, rows over one strip of the column pass and heights over one band of the row pass.
  const Case cases[] = {{1, 1, 3, 1},    {1, 7, 4, 3},     {7, 1, 3, 5},     {5, 6, 3, 2},
                        {13, 11, 4, 4},  {9, 9, 4, 0},     {3, 4, 3, 20},    {300, 70, 4, 7},
                        {347, 33, 3, 2}, {6, 300, 4, 255}, {300, 3, 3, 255}, {17, 19, 4, 254},
                        {40, 65, 3, 31}, {2, 2, 4, 100},   {700, 5, 4, 200}, {900, 4, 3, 200}};
  for (const Case& c : cases) {
    for (const int pass : {1, 2}) {
      SCOPED_TRACE(testing::Message() << c.width << "x" << c.height << " channels " << c.channels
                                      << " radius " << c.radius << " pass " << pass);
      for (const bool saturated : {false, true}) {
        // Saturated pixels give the largest sums, whose products need every bit.
        Bytes source = NoiseBytes(StackblurStride(c.width, c.channels) * c.height, 11);
        if (saturated) {
          for (size_t i = 0; i < source.size(); ++i) source[i] = uint8_t(250 + i % 6);
        }
        Bytes expected = source;
        ReferenceStackblur(expected, c.width, c.height, c.channels, c.radius, pass);
        tfx_test::ForEveryTarget([&] {
          Bytes image = source;
          stackblur(image.data(), c.width, c.height, c.channels, c.radius, pass);
          EXPECT_EQ(image, expected);
        });
      }
    }
  }
}

TEST(Stackblur, CapsColourAtAlphaAndZeroesOtherLayouts) {
  Bytes bgra = NoiseBytes(8 * 8 * 4, 3);
  for (size_t i = 3; i < bgra.size(); i += 4 * 5) bgra[i] = 0;
  stackblur(bgra.data(), 8, 8, 4, 3, 1);
  for (size_t i = 3; i < bgra.size(); i += 4 * 5) {
    EXPECT_EQ(bgra[i - 3] | bgra[i - 2] | bgra[i - 1], 0) << i;
  }
  // Five-byte pixels: the cap is 0 for the first three bytes; bytes 3 and 4 stay.
  Bytes wide = NoiseBytes(StackblurStride(5, 5) * 3, 4);
  Bytes expected = wide;
  for (int y = 0; y < 3; ++y) {
    for (int x = 0; x < 5; ++x) std::memset(&expected[y * 28 + x * 5], 0, 3);
  }
  stackblur(wide.data(), 5, 3, 5, 2, 2);
  EXPECT_EQ(wide, expected);
  // One-byte pixels lose their byte without writing past the buffer.
  Bytes grey = NoiseBytes(StackblurStride(5, 1) * 2, 5);
  stackblur(grey.data(), 5, 2, 1, 2, 1);
  for (int y = 0; y < 2; ++y) {
    for (int x = 0; x < 5; ++x) EXPECT_EQ(grey[y * 8 + x], 0);
  }
}

TEST(GaussianBlur, BlursRowsThenColumnsForRadius1To254Only) {
  const int w = 9, h = 7;
  const Bytes noise = NoiseBytes(StackblurStride(w, 4) * h, 8);
  for (const int radius : {-1, 0, 255, 1000}) {
    Bytes image = noise;
    gaussianBlur(image.data(), w, h, 4, radius);
    EXPECT_EQ(image, noise) << radius;
  }
  for (const int radius : {1, 6, 254}) {
    Bytes image = noise, expected = noise;
    gaussianBlur(image.data(), w, h, 4, radius);
    ReferenceStackblur(expected, w, h, 4, radius, 1);
    ReferenceStackblur(expected, w, h, 4, radius, 2);
    EXPECT_EQ(image, expected) << radius;
    EXPECT_NE(image, noise);
  }
}

// ---- Box blur ---------------------------------------------------------------------------------

TEST(FastAverageBlur, IsABoxMeanOfBoxMeansOnEveryTarget) {
  struct Case {
    int width, height, channels, radius;
  };
  // Rows narrower than the window, heights just above the radius and past the ring of 2 radius
  // + 2 rows, every channel count, and radii from 128 on, whose quotients no 32-bit multiply
  // gives.
  const Case cases[] = {{1, 2, 1, 1},    {5, 4, 3, 3},     {2, 9, 1, 4},      {16, 9, 3, 8},
                        {9, 9, 4, 2},    {7, 12, 2, 5},    {30, 31, 3, 1},    {3, 6, 5, 5},
                        {41, 9, 3, 7},   {3, 140, 3, 130}, {40, 129, 1, 128}, {33, 20, 4, 19},
                        {4, 300, 3, 128}};
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::Message() << c.width << "x" << c.height << " channels " << c.channels
                                    << " radius " << c.radius);
    for (const bool high : {false, true}) {
      Bytes source = NoiseBytes(size_t(c.width) * c.height * c.channels, 21);
      if (high) {
        for (uint8_t& v : source) v = uint8_t(v | 0xf8);  // the largest sums
      }
      const Bytes expected = BoxReference(source, c.width, c.height, c.channels, c.radius);
      tfx_test::ForEveryTarget([&] {
        Bytes image = source;
        fastAverageBlur(image.data(), c.width, c.height, c.channels, c.radius);
        EXPECT_EQ(image, expected);
      });
    }
  }
  // With 4 channels bytes 1 to 3 are left alone.
  const Bytes noise = NoiseBytes(6 * 5 * 4, 22);
  Bytes image = noise;
  fastAverageBlur(image.data(), 6, 5, 4, 2);
  for (size_t i = 0; i < image.size(); ++i) {
    if (i % 4 != 0) {
      EXPECT_EQ(image[i], noise[i]) << i;
    }
  }
}

// ---- Window statistics ------------------------------------------------------------------------

struct WindowCase {
  int width, height, radius;
};

// Planes narrower and shorter than the window, the widths that skip the last column (radius + 2
// to 2 radius) and windows whose counters wrap (radius 8 and up).
const WindowCase kWindowCases[] = {{1, 1, 1},    {1, 9, 2},   {9, 1, 2},   {5, 1, 3},  {6, 4, 3},
                                   {7, 7, 3},    {8, 3, 4},   {3, 9, 2},   {9, 9, 1},  {20, 5, 7},
                                   {12, 12, 20}, {33, 21, 8}, {19, 40, 9}, {64, 48, 5}};

// Noise, or noise pushed near 255 for the largest sums and squares.
Bytes WindowSource(const WindowCase& c, bool high) {
  Bytes src = NoiseBytes(size_t(c.width) * c.height, 31);
  if (high) {
    for (uint8_t& v : src) v = uint8_t(v | 0xf0);
  }
  return src;
}

TEST(WindowFilters, MeanAndVarianceFollowTheDefinedWalk) {
  // The last column left out of the sum but counted.
  const Bytes last_only = {0, 0, 0, 0, 255};
  Bytes dst(5, 77);
  fastWindowAverageFilter(last_only.data(), dst.data(), 5, 1, 3);
  EXPECT_EQ(dst, Bytes(5, 0));

  std::vector<WindowCase> cases(std::begin(kWindowCases), std::end(kWindowCases));
  cases.push_back({260, 259, 129});  // windows over 66051 pixels need 64-bit totals
  for (const WindowCase& c : cases) {
    SCOPED_TRACE(testing::Message() << c.width << "x" << c.height << " radius " << c.radius);
    for (const bool high : {false, true}) {
      if (c.width > 255 && !high) continue;  // the largest values are what the big case is for
      const Bytes src = WindowSource(c, high);
      Bytes mean(src.size()), variance(src.size());
      fastWindowAverageFilter(src.data(), mean.data(), c.width, c.height, c.radius);
      fastWindowVarianceFilter(src.data(), variance.data(), c.width, c.height, c.radius);
      EXPECT_EQ(mean, LiteralWindowWalk(src, c.width, c.height, c.radius, Stat::kMean));
      EXPECT_EQ(variance, LiteralWindowWalk(src, c.width, c.height, c.radius, Stat::kVariance));
    }
  }
}

TEST(WindowFilters, PercentileFollowsTheDefinedWalkOnEveryTarget) {
  for (const WindowCase& c : kWindowCases) {
    SCOPED_TRACE(testing::Message() << c.width << "x" << c.height << " radius " << c.radius);
    for (const bool high : {false, true}) {
      const Bytes src = WindowSource(c, high);
      for (const float p : {0.0f, 0.5f, 0.93f, 1.0f}) {
        const Bytes expected =
            LiteralWindowWalk(src, c.width, c.height, c.radius, Stat::kPercentile, p);
        tfx_test::ForEveryTarget([&] {
          Bytes percentile(src.size());
          fastFilter(src.data(), percentile.data(), c.width, c.height, c.radius, p);
          EXPECT_EQ(percentile, expected) << p;
        });
      }
    }
  }
}

TEST(WindowFilters, KeepTheirDefinedQuirksOnSmallWindows) {
  // 0 and 255 side by side: the variance is 16256.25, stored as its low byte.
  const Bytes halves = {0, 255};
  Bytes dst(2);
  fastWindowVarianceFilter(halves.data(), dst.data(), 2, 1, 1);
  EXPECT_EQ(dst, Bytes(2, 16256 & 255));
  // One 3x3 window at the centre: percentiles 0 (or below), 0.5 and 1 (or above).
  const Bytes window = {9, 3, 7, 1, 5, 8, 2, 6, 4};
  const std::pair<float, uint8_t> cases[] = {
      {0.0f, 1}, {-2.0f, 1}, {0.5f, 5}, {1.0f, 9}, {7.0f, 9}};
  for (const auto& [percentile, centre] : cases) {
    Bytes out(9);
    fastFilter(window.data(), out.data(), 3, 3, 1, percentile);
    EXPECT_EQ(out[4], centre) << percentile;
  }
  // A 17x17 window of one value holds 289 = 33 mod 256 in its bin: the median's target, 145, is
  // never reached and the low byte of 256 is stored; a target of 29 is.
  const Bytes flat(17 * 17, 200);
  Bytes out(flat.size());
  fastFilter(flat.data(), out.data(), 17, 17, 8, 0.5f);
  EXPECT_EQ(out[8 * 17 + 8], 0);
  fastFilter(flat.data(), out.data(), 17, 17, 8, 0.1f);
  EXPECT_EQ(out[8 * 17 + 8], 200);
}

TEST(CalFilterValue, ScansForTheFirstNonEmptyBinReachingTheTarget) {
  const uint8_t bins[6] = {0, 2, 0, 0, 3, 1};
  EXPECT_EQ(calFilterValue(bins, 6, 0), 1);
  EXPECT_EQ(calFilterValue(bins, 6, 2), 1);
  EXPECT_EQ(calFilterValue(bins, 6, 3), 4);
  EXPECT_EQ(calFilterValue(bins, 6, 6), 5);
  EXPECT_EQ(calFilterValue(bins, 6, 7), 6);
  EXPECT_EQ(calFilterValue(bins, 0, 0), 0);
  EXPECT_EQ(calFilterValue(bins, -3, 0), 0);
  EXPECT_EQ(calFilterValue(nullptr, 6, 0), 0);
}

// ---- Bad input --------------------------------------------------------------------------------

TEST(BlurFamily, BadInputLeavesEveryBufferAlone) {
  // 4x4 BGRA buffers of their exact size, so that any access past them shows under the
  // sanitizers.
  struct Case {
    const char* name;
    int width, height, channels, radius;
  };
  const Case cases[] = {{"zero width", 0, 4, 4, 2},
                        {"zero height", 4, 0, 4, 2},
                        {"negative width", -4, 4, 4, 2},
                        {"negative height", 4, -1, 4, 2},
                        {"no channels", 4, 4, 0, 2},
                        {"negative channels", 4, 4, -3, 2},
                        {"overflowing", 1 << 30, 1 << 30, 4, 2}};
  const Bytes noise = NoiseBytes(4 * 4 * 4, 51);
  Bytes image = noise, out = noise;
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    gaussianBlur(image.data(), c.width, c.height, c.channels, c.radius);
    fastAverageBlur(image.data(), c.width, c.height, c.channels, c.radius);
    if (c.channels > 0) {  // the window filters take one channel
      fastWindowAverageFilter(image.data(), out.data(), c.width, c.height, c.radius);
      fastWindowVarianceFilter(image.data(), out.data(), c.width, c.height, c.radius);
      fastFilter(image.data(), out.data(), c.width, c.height, c.radius, 0.5f);
    }
  }
  stackblur(nullptr, 4, 4, 4, 2, 1);
  stackblur(image.data(), 4, 4, 4, 256, 1);
  stackblur(image.data(), 4, 4, 4, 2, 3);
  stackblur(image.data(), 0, 4, 4, 2, 1);
  stackblur(image.data(), 4, 0, 4, 2, 2);
  stackblur(image.data(), 0xffffffffu, 0xffffffffu, 4, 2, 2);
  gaussianBlur(nullptr, 4, 4, 4, 2);
  fastAverageBlur(image.data(), 4, 4, 4, 4);  // the first window of a column would not fit
  fastAverageBlur(image.data(), 4, 4, 4, 0);
  fastAverageBlur(nullptr, 4, 4, 4, 2);
  fastWindowAverageFilter(nullptr, out.data(), 4, 4, 2);
  fastWindowVarianceFilter(image.data(), nullptr, 4, 4, 2);
  fastFilter(nullptr, out.data(), 4, 4, 2, 0.5f);
  EXPECT_EQ(image, noise);
  EXPECT_EQ(out, noise);
  // Radius below 1 copies the plane.
  for (const int radius : {0, -4}) {
    Bytes mean(out.size()), variance(out.size()), percentile(out.size());
    fastWindowAverageFilter(noise.data(), mean.data(), 16, 4, radius);
    fastWindowVarianceFilter(noise.data(), variance.data(), 16, 4, radius);
    fastFilter(noise.data(), percentile.data(), 16, 4, radius, 0.3f);
    EXPECT_EQ(mean, noise);
    EXPECT_EQ(variance, noise);
    EXPECT_EQ(percentile, noise);
  }
}

}  // namespace
