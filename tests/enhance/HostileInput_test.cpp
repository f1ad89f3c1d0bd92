// Arguments a host may pass by mistake: sizes and radii near INT_MAX that describe nothing a
// caller could hold. Each case would reach past a buffer or overflow an offset if the function
// did not see it first; the sanitizer build reports those.
#include <gtest/gtest.h>

#include <climits>
#include <cstdint>
#include <functional>
#include <utility>
#include <vector>

#include "support/ImageBuilders.h"
#include "tessarofx/Blur.h"
#include "tessarofx/Compositing.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/Denoise.h"
#include "tessarofx/DetailFilters.h"
#include "tessarofx/WhiteBalanceEstimate.h"

namespace {

using tfx_test::NoiseBytes;

// A radius past every edge gives the window of the whole plane, however far past it is. The
// plane is wide enough that rows a radius of INT_MAX away lie outside the address space.
TEST(WindowFilters, TreatRadiiFarBeyondThePlaneAsTheWholePlane) {
  const int w = 1 << 17, h = 2;
  const std::vector<uint8_t> src = NoiseBytes(size_t{w} * h, 3);
  using Filter = std::function<void(std::vector<uint8_t>&, int radius)>;
  const struct {
    const char* name;
    Filter run;
  } filters[] = {
      {"mean", [&](auto& out, int r) { fastWindowAverageFilter(src.data(), out.data(), w, h, r); }},
      {"variance",
       [&](auto& out, int r) { fastWindowVarianceFilter(src.data(), out.data(), w, h, r); }},
      {"channelDenoise",
       [&](auto& out, int r) {
         out = src;
         channelDenoise(out.data(), w, h, r < INT_MAX / 2 ? 2 * r + 1 : INT_MAX, 20.0f);
       }},
  };
  for (const auto& filter : filters) {
    SCOPED_TRACE(filter.name);
    std::vector<uint8_t> whole(src.size()), far(src.size());
    filter.run(whole, w);
    for (const int radius : {1 << 30, INT_MAX}) {
      SCOPED_TRACE(radius);
      filter.run(far, radius);
      EXPECT_EQ(far, whole);
    }
  }
}

// Destinations and sources above INT_MAX bytes are refused before a row is touched; the largest
// ones would put row offsets past 64 bits. The buffers are small: only the sizes are huge.
TEST(MergeImage, LeavesImagesAboveIntMaxBytesAlone) {
  const std::vector<uint8_t> src = NoiseBytes(64 * 64 * 4, 5);
  const struct {
    const char* name;
    int dstWidth, dstHeight, srcWidth, srcHeight, srcStride;
  } cases[] = {
      {"destination past 64-bit offsets", INT_MAX, INT_MAX, 8, 8, 32},
      {"destination of 4 GiB", 1 << 16, 1 << 14, 8, 8, 32},
      {"destination of 2 GiB", 1 << 15, 1 << 14, 8, 8, 32},
      {"source of 4 GiB", 8, 8, 8, 1 << 16, 1 << 16},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    std::vector<uint8_t> dst = NoiseBytes(64 * 64 * 4, 6);
    const std::vector<uint8_t> before = dst;
    EXPECT_TRUE(mergeImage(dst.data(), src.data(), c.dstWidth, c.dstHeight, c.srcWidth, c.srcHeight,
                           c.srcStride, 0, 0, -1, -1, 0, 0, 100, 100));
    EXPECT_EQ(dst, before);
  }
}

// 24-bit rows of width * 3 bytes, not padded to 4: recombining the planes would re-create the
// image with padded rows that the wrapped buffer cannot hold.
TEST(DeNoise, LeavesAWrappedImageItsRowsCannotBePaddedIn) {
  std::vector<uint8_t> pixels = NoiseBytes(15 * 12, 3);
  const std::vector<uint8_t> before = pixels;
  uint8_t* bits = pixels.data();
  CxImage image(&bits, 5, 12, 24, 15, IPF_BGR);
  for (auto* denoise : {deNoiseRGB, deNoiseLumiance}) {
    EXPECT_EQ(denoise(&image, 80.0f), &image);
    EXPECT_EQ(image.GetWidth(), 5u);
    EXPECT_EQ(image.GetEffWidth(), 15u);
    EXPECT_EQ(pixels, before);
  }
}

// A size above INT_MAX bytes over a small buffer counts as no image: nothing is read.
TEST(WhiteBalanceEstimate, TreatsImagesAboveIntMaxBytesAsEmpty) {
  std::vector<uint8_t> src(16, 200), dst(16, 7);
  for (const auto& [width, height] : {std::pair{32768, 16384}, std::pair{INT_MAX, 1}}) {
    SCOPED_TRACE(width);
    EXPECT_EQ(channelMean(src.data(), width, height, 0), 255);
    EXPECT_EQ(doAutoWhiteBalance(src.data(), dst.data(), width, height), src.data());
    EXPECT_EQ(getAutoWhiteBalanceCCTChangeRate(src.data(), dst.data(), width, height), 0.0);
    EXPECT_EQ(getAutoWhiteBalanceTintChangeRate(src.data(), dst.data(), width, height), 0.0);
    EXPECT_EQ(dst, std::vector<uint8_t>(16, 7));
  }
}

TEST(Planes, AboveIntMaxBytesAreLeftAlone) {
  std::vector<uint8_t> src = NoiseBytes(64, 1), dst(64, 7);
  dct_Denosing(src.data(), dst.data(), 16, 3, INT_MAX / 2, 10.0f);
  EXPECT_EQ(dst, std::vector<uint8_t>(64, 7));
  EXPECT_EQ(calL(src.data(), dst.data(), 65536, 65536, 1.0f), nullptr);
  EXPECT_FALSE(clipOutBorder(src.data(), dst.data(), 4, 3, INT_MAX / 2, 2, 2, 8));
  unsigned char* frame = nullptr;
  int frameWidth = 0, frameHeight = 0;
  EXPECT_EQ(makeImageFrame(&frame, &frameWidth, &frameHeight, src.data(), 2, 3, INT_MAX / 2, 32,
                           PIPNLERGB{1, 2, 3, 255}, 1),
            0);
  delete[] frame;
  EXPECT_EQ(dst, std::vector<uint8_t>(64, 7));
}

}  // namespace
