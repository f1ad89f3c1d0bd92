#include "tessarofx/Blur.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cstdint>
#include <vector>

#include "support/EveryTarget.h"
#include "support/ImageBuilders.h"
#include "tessarofx/Denoise.h"

namespace {

using tfx_test::Bytes;
using tfx_test::NoiseBytes;

size_t StackblurStride(int width, int channels) { return (size_t(width) * channels + 3) & ~3u; }

// One pass as the in-place walk defines it: triangle-weighted sums of the samples before the
// pass, edges repeated, times mul >> shr, capped by alpha (4 channels), 255 (3) or 0 (fewer).
void ReferenceStackblur(Bytes& image, int width, int height, int channels, int radius, int pass) {
  const Bytes in = image;
  const int64_t stride = StackblurStride(width, channels), r = radius;
  const int64_t length = pass == 1 ? width : height, lines = pass == 1 ? height : width;
  for (int64_t l = 0; l < lines; ++l) {
    auto at = [&](int64_t i) {
      return pass == 1 ? l * stride + i * channels : i * stride + l * channels;
    };
    for (int64_t i = 0; i < length; ++i) {
      for (int c = 0; c < std::min(channels, 3); ++c) {
        uint64_t sum = 0;
        for (int64_t k = -r; k <= r; ++k) {
          sum +=
              uint64_t(r + 1 - std::abs(k)) * in[at(std::clamp<int64_t>(i + k, 0, length - 1)) + c];
        }
        const uint64_t limit = channels == 4 ? in[at(i) + 3] : channels == 3 ? 255 : 0;
        image[at(i) + c] = uint8_t(std::min((sum * stackblur_mul[r]) >> stackblur_shr[r], limit));
      }
    }
  }
}

// Box means of box means, edges repeated, each truncated; all three bytes of 3-byte pixels, else
// byte 0 only.
Bytes BoxReference(const Bytes& in, int64_t w, int64_t h, int channels, int64_t radius) {
  Bytes out = in;
  std::vector<int64_t> rows(w * h);
  auto box = [&](auto sample, int64_t i, int64_t n) {
    int64_t sum = 0;
    for (int64_t k = -radius; k <= radius; ++k) sum += sample(std::clamp<int64_t>(i + k, 0, n - 1));
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

// The window walk step by step as defined, including the right column it skips on narrow planes.
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

TEST(StackblurTables, FollowTheirRule) {
  // The reference reads these tables too, so only their rule can catch a wrong entry.
  for (uint32_t r = 0; r < 256; ++r) {
    const uint32_t area = (r + 1) * (r + 1);
    uint32_t log2 = 0;
    while ((area >> (log2 + 1)) != 0) ++log2;
    ASSERT_EQ(stackblur_shr[r], log2 + 9) << r;
    ASSERT_EQ(stackblur_mul[r], ((1u << stackblur_shr[r]) + area - 1) / area) << r;
  }
}

TEST(Stackblur, EachPassAndTheirPairMatchTheDefinitionOnEveryTarget) {
  // Lines shorter than the radius, single pixels, padded rows, vector tails, rows over one strip
  // of the column pass and heights over one band of the row pass; radii 0 and 255, which
  // gaussianBlur refuses; five- and one-byte pixels.
  const struct {
    int width, height, channels, radius;
  } cases[] = {{1, 1, 3, 1},    {1, 7, 4, 3},     {7, 1, 3, 5},     {5, 6, 3, 2},
               {13, 11, 4, 4},  {9, 9, 4, 0},     {3, 4, 3, 20},    {300, 70, 4, 7},
               {347, 33, 3, 2}, {6, 300, 4, 255}, {300, 3, 3, 255}, {17, 19, 4, 254},
               {40, 65, 3, 31}, {2, 2, 4, 100},   {700, 5, 4, 200}, {900, 4, 3, 200},
               {5, 3, 5, 2},    {5, 2, 1, 2}};
  for (const auto& c : cases) {
    for (const bool saturated : {false, true}) {  // the largest sums need every bit
      SCOPED_TRACE(testing::Message() << c.width << "x" << c.height << " channels " << c.channels
                                      << " radius " << c.radius << " saturated " << saturated);
      Bytes source = NoiseBytes(StackblurStride(c.width, c.channels) * c.height, 11);
      for (size_t i = 0; saturated && i < source.size(); ++i) source[i] = uint8_t(250 + i % 6);
      Bytes rows = source, columns = source;
      ReferenceStackblur(rows, c.width, c.height, c.channels, c.radius, 1);
      ReferenceStackblur(columns, c.width, c.height, c.channels, c.radius, 2);
      Bytes both = c.radius >= 1 && c.radius <= 254 ? rows : source;
      if (c.radius >= 1 && c.radius <= 254) {
        ReferenceStackblur(both, c.width, c.height, c.channels, c.radius, 2);
      }
      tfx_test::ForEveryTarget([&] {
        for (const int pass : {1, 2}) {
          Bytes image = source;
          stackblur(image.data(), c.width, c.height, c.channels, c.radius, pass);
          EXPECT_EQ(image, pass == 1 ? rows : columns) << "pass " << pass;
        }
        Bytes image = source;
        gaussianBlur(image.data(), c.width, c.height, c.channels, c.radius);
        EXPECT_EQ(image, both) << "gaussianBlur";
      });
    }
  }
}

TEST(FastAverageBlur, IsABoxMeanOfBoxMeansOnEveryTarget) {
  // Rows narrower than the window, heights just above the radius and past the ring of 2 radius
  // + 2 rows, every channel count, radii from 128 on (no 32-bit multiply gives their quotients),
  // and rows of many vectors at small radii, whose windows are summed directly, and just above.
  const struct {
    int width, height, channels, radius;
  } cases[] = {{1, 2, 1, 1},     {5, 4, 3, 3},     {2, 9, 1, 4},      {16, 9, 3, 8},
               {9, 9, 4, 2},     {7, 12, 2, 5},    {30, 31, 3, 1},    {3, 6, 5, 5},
               {41, 9, 3, 7},    {3, 140, 3, 130}, {40, 129, 1, 128}, {33, 20, 4, 19},
               {4, 300, 3, 128}, {131, 17, 3, 7},  {150, 18, 4, 8},   {133, 16, 1, 6},
               {70, 12, 3, 2}};
  for (const auto& c : cases) {
    for (const bool high : {false, true}) {  // high: the largest sums
      SCOPED_TRACE(testing::Message() << c.width << "x" << c.height << " channels " << c.channels
                                      << " radius " << c.radius << " high " << high);
      Bytes source = NoiseBytes(size_t(c.width) * c.height * c.channels, 21);
      for (uint8_t& v : source) v = high ? uint8_t(v | 0xf8) : v;
      const Bytes expected = BoxReference(source, c.width, c.height, c.channels, c.radius);
      tfx_test::ForEveryTarget([&] {
        Bytes image = source;
        fastAverageBlur(image.data(), c.width, c.height, c.channels, c.radius);
        EXPECT_EQ(image, expected);
      });
    }
  }
}

TEST(WindowFilters, MeanVarianceAndPercentileFollowTheDefinedWalk) {
  // Planes narrower and shorter than the window, the widths that skip the last column (radius + 2
  // to 2 radius), windows whose counters wrap (radius 8 and up) and, for mean and variance,
  // windows over 66051 pixels, which need 64-bit totals.
  const struct {
    int width, height, radius;
  } cases[] = {{1, 1, 1},    {1, 9, 2},   {9, 1, 2},   {5, 1, 3},   {6, 4, 3},
               {7, 7, 3},    {8, 3, 4},   {3, 9, 2},   {9, 9, 1},   {20, 5, 7},
               {12, 12, 20}, {33, 21, 8}, {19, 40, 9}, {64, 48, 5}, {260, 259, 129}};
  for (const auto& c : cases) {
    const bool big = c.width > 255;
    // Noise; noise near 255 for the largest sums and squares; one value, whose bin wraps in
    // windows of 256 pixels and more, so that the median's target is never reached.
    for (const int kind : {0, 1, 2}) {
      if (big && kind != 1) continue;  // the largest values are what the big case is for
      SCOPED_TRACE(testing::Message()
                   << c.width << "x" << c.height << " radius " << c.radius << " kind " << kind);
      Bytes src = NoiseBytes(size_t(c.width) * c.height, 31);
      for (uint8_t& v : src) v = kind == 0 ? v : kind == 1 ? uint8_t(v | 0xf0) : 200;
      Bytes mean(src.size()), variance(src.size());
      fastWindowAverageFilter(src.data(), mean.data(), c.width, c.height, c.radius);
      fastWindowVarianceFilter(src.data(), variance.data(), c.width, c.height, c.radius);
      EXPECT_EQ(mean, LiteralWindowWalk(src, c.width, c.height, c.radius, Stat::kMean));
      EXPECT_EQ(variance, LiteralWindowWalk(src, c.width, c.height, c.radius, Stat::kVariance));
      for (const float p : {-2.0f, 0.0f, 0.5f, 0.93f, 1.0f, 7.0f}) {  // out of 0..1 is clamped
        if (big) break;
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

TEST(CalFilterValue, ScansForTheFirstNonEmptyBinReachingTheTarget) {
  const uint8_t bins[6] = {0, 2, 0, 0, 3, 1};
  const int targetAndBin[][2] = {{0, 1}, {2, 1}, {3, 4}, {6, 5}, {7, 6}};  // 7: none reaches it
  for (const auto& [target, bin] : targetAndBin) {
    EXPECT_EQ(calFilterValue(bins, 6, target), bin) << target;
  }
  EXPECT_EQ(calFilterValue(bins, 0, 0), 0);
  EXPECT_EQ(calFilterValue(bins, -3, 0), 0);
  EXPECT_EQ(calFilterValue(nullptr, 6, 0), 0);
}

// The plane is wide enough that rows a radius of INT_MAX away lie outside the address space.
TEST(WindowFilters, TreatRadiiFarBeyondThePlaneAsTheWholePlane) {
  const int w = 1 << 17, h = 2;
  const Bytes src = NoiseBytes(size_t{w} * h, 3);
  // Mean, variance, and channelDenoise with a window of 2 r + 1.
  const auto run = [&](int filter, int r) {
    Bytes out = src;
    if (filter == 0) fastWindowAverageFilter(src.data(), out.data(), w, h, r);
    if (filter == 1) fastWindowVarianceFilter(src.data(), out.data(), w, h, r);
    if (filter == 2) channelDenoise(out.data(), w, h, r < INT_MAX / 2 ? 2 * r + 1 : INT_MAX, 20);
    return out;
  };
  for (int filter = 0; filter < 3; ++filter) {
    const Bytes whole = run(filter, w);
    for (const int radius : {1 << 30, INT_MAX}) {
      EXPECT_EQ(run(filter, radius), whole) << "filter " << filter << " radius " << radius;
    }
  }
}

TEST(BlurFamily, BadInputLeavesEveryBufferAlone) {
  // Buffers of their exact size, so that any access past them shows under the sanitizers. Sizes
  // below 1, no channels (for channelDenoise, no window), and areas past what they can address.
  const int cases[][3] = {{0, 4, 4}, {4, 0, 4},  {-4, 4, 4},           {4, -1, 4},
                          {4, 4, 0}, {4, 4, -3}, {1 << 30, 1 << 30, 4}};
  const Bytes noise = NoiseBytes(4 * 4 * 4, 51);
  Bytes image = noise, out = noise;
  for (const auto& [w, h, channels] : cases) {
    gaussianBlur(image.data(), w, h, channels, 2);
    fastAverageBlur(image.data(), w, h, channels, 2);
    channelDenoise(image.data(), w, h, channels, 10.0f);
    if (channels > 0) {  // the window filters take one channel
      fastWindowAverageFilter(image.data(), out.data(), w, h, 2);
      fastWindowVarianceFilter(image.data(), out.data(), w, h, 2);
      fastFilter(image.data(), out.data(), w, h, 2, 0.5f);
    }
  }
  stackblur(nullptr, 4, 4, 4, 2, 1);
  stackblur(image.data(), 4, 4, 4, 256, 1);
  stackblur(image.data(), 4, 4, 4, 2, 3);
  stackblur(image.data(), 0, 4, 4, 2, 1);
  stackblur(image.data(), 4, 0, 4, 2, 2);
  stackblur(image.data(), 0xffffffffu, 0xffffffffu, 4, 2, 2);
  gaussianBlur(nullptr, 4, 4, 4, 2);
  gaussianBlur(image.data(), 4, 4, 4, -1);
  gaussianBlur(image.data(), 4, 4, 4, 1000);
  fastAverageBlur(image.data(), 4, 4, 4, 4);  // the first window of a column would not fit
  fastAverageBlur(image.data(), 4, 4, 4, 0);
  fastAverageBlur(nullptr, 4, 4, 4, 2);
  fastWindowAverageFilter(nullptr, out.data(), 4, 4, 2);
  fastWindowVarianceFilter(image.data(), nullptr, 4, 4, 2);
  fastFilter(nullptr, out.data(), 4, 4, 2, 0.5f);
  channelDenoise(nullptr, 4, 4, 3, 10.0f);
  channelDenoise(image.data(), 1 << 16, 1 << 15, 5, 10.0f);  // 2^31 bytes
  EXPECT_EQ(image, noise);
  EXPECT_EQ(out, noise);
  for (const int radius : {0, -4}) {  // copies the plane
    Bytes mean(out.size()), variance(out.size()), percentile(out.size());
    fastWindowAverageFilter(noise.data(), mean.data(), 16, 4, radius);
    fastWindowVarianceFilter(noise.data(), variance.data(), 16, 4, radius);
    fastFilter(noise.data(), percentile.data(), 16, 4, radius, 0.3f);
    EXPECT_TRUE(mean == noise && variance == noise && percentile == noise) << radius;
  }
}

}  // namespace
