#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <string>
#include <vector>

#include "support/ImageBuilders.h"
#include "tessarofx/Blur.h"
#include "tessarofx/Denoise.h"

namespace {

using tfx_test::NoiseBytes;

TEST(ChannelDenoise, PullsEachPixelTowardsItsWindowMean) {
  // Noise with flat patches: zero variance bytes come from flat windows and from noisy ones
  // whose variance wrapped.
  const int w = 61, h = 47;
  std::vector<uint8_t> source = NoiseBytes(w * h, 7);
  for (int i = 0; i < w * h; ++i) source[i] = (i % w / 8 + i / w / 8) % 3 ? source[i] : 90;
  const auto byte = [](double x) { return static_cast<int>(std::clamp(x, 0.0, 255.0)); };
  for (const int windowSize : {1, 3, 4, 7}) {
    std::vector<uint8_t> mean(w * h), variance(w * h);
    fastWindowAverageFilter(source.data(), mean.data(), w, h, (windowSize - 1) / 2);
    fastWindowVarianceFilter(source.data(), variance.data(), w, h, (windowSize - 1) / 2);
    EXPECT_NE(std::count(variance.begin(), variance.end(), 0), 0);
    for (const float noise : {0.0f, 0.5f, 40.0f, 1e6f}) {
      SCOPED_TRACE("window " + std::to_string(windowSize) + ", noise " + std::to_string(noise));
      std::vector<uint8_t> plane = source;
      channelDenoise(plane.data(), w, h, windowSize, noise);
      for (int i = 0; i < w * h; ++i) {
        const double v = variance[i], k = v / (v + noise);
        const double value = source[i] * k + mean[i] * (1 - k);
        if (v == 0) {
          ASSERT_EQ(plane[i], mean[i]) << i;  // whatever the noise, 0 included
        } else if (noise == 0.0f) {
          ASSERT_EQ(plane[i], source[i]) << i;
        } else {
          // Float rounding may put a value within 1e-4 of an integer on either side of it.
          ASSERT_TRUE(plane[i] == byte(value - 1e-4) || plane[i] == byte(value + 1e-4))
              << i << ": " << int(plane[i]) << " for " << value;
        }
      }
    }
  }
}

TEST(ChannelDenoise, LeavesBadInputAlone) {
  const std::vector<uint8_t> source = NoiseBytes(200, 9);
  struct Case {
    int width, height, windowSize;
  };
  // Sizes below 1, window sizes below 1, and an area past 2^31 - 1 bytes.
  for (const Case c : {Case{0, 10, 5}, Case{-2, 10, 5}, Case{20, 0, 5}, Case{20, -7, 5},
                       Case{20, 10, 0}, Case{20, 10, -5}, Case{1 << 16, 1 << 15, 5}}) {
    SCOPED_TRACE(std::to_string(c.width) + "x" + std::to_string(c.height) + ", window " +
                 std::to_string(c.windowSize));
    std::vector<uint8_t> plane = source;
    channelDenoise(plane.data(), c.width, c.height, c.windowSize, 10.0f);
    EXPECT_EQ(plane, source);
  }
  channelDenoise(nullptr, 20, 10, 5, 10.0f);
}

}  // namespace
