#include "tessarofx/WhiteBalanceEstimate.h"

#include <gtest/gtest.h>

#include <climits>
#include <cstdint>
#include <limits>
#include <utility>
#include <vector>

namespace {

// A width x height image of one BGRA colour.
std::vector<uint8_t> Flat(int width, int height, uint8_t b, uint8_t g, uint8_t r, uint8_t a = 255) {
  std::vector<uint8_t> px;
  for (int i = 0; i < width * height; ++i) px.insert(px.end(), {b, g, r, a});
  return px;
}

int64_t MiredsOf(uint8_t r, uint8_t g, uint8_t b) {
  float X, Y, Z, x, y, Yout;
  rgb2xyz(r, g, b, X, Y, Z);
  xyz2xy(X, Y, Z, x, y, Yout);
  return xy_to_CCT_Hernandez1999(x, y);
}

TEST(ChannelMean, AveragesOneByteAndRefusesBadInput) {
  // Bytes 0 and 2 vary, so their means truncate.
  std::vector<uint8_t> px = Flat(3, 2, 10, 20, 30, 40);
  px[0] = 16;   // byte 0 sums to 66: mean 11
  px[22] = 35;  // byte 2 sums to 185: mean 30 (truncated)
  EXPECT_EQ(channelMean(px.data(), 3, 2, 0), 11);
  EXPECT_EQ(channelMean(px.data(), 3, 2, 1), 20);
  EXPECT_EQ(channelMean(px.data(), 3, 2, 2), 30);
  EXPECT_EQ(channelMean(px.data(), 3, 2, 3), 0);  // byte 3 is never summed
  EXPECT_EQ(channelMean(nullptr, 3, 2, 0), 255);
  EXPECT_EQ(channelMean(px.data(), 3, 2, 4), 255);
  EXPECT_EQ(channelMean(px.data(), 3, -2, 0), 255);
}

TEST(DoAutoWhiteBalance, CopiesOneRowOnly) {
  std::vector<uint8_t> src = Flat(2, 2, 1, 2, 3, 4), dst(16, 0xee);
  EXPECT_EQ(doAutoWhiteBalance(src.data(), dst.data(), 2, 2), dst.data());
  for (int i = 0; i < 16; ++i) EXPECT_EQ(dst[size_t(i)], i < 8 ? src[size_t(i)] : 0xee) << i;
  EXPECT_EQ(doAutoWhiteBalance(src.data(), nullptr, 2, 2), src.data());
  EXPECT_EQ(doAutoWhiteBalance(src.data(), dst.data(), 2, 0), src.data());
}

TEST(ColourScience, ConvertsWhiteAndD65) {
  float X, Y, Z;
  rgb2xyz(255, 255, 255, X, Y, Z);
  EXPECT_NEAR(X, 0.95047f, 1e-5f);
  EXPECT_NEAR(Y, 1.0f, 1e-5f);
  EXPECT_NEAR(Z, 1.08883f, 1e-5f);
  // Below 0.04045 the curve is linear.
  rgb2xyz(10, 0, 0, X, Y, Z);
  EXPECT_FLOAT_EQ(X, 0.4124564f * (10 / 255.0f / 12.92f));

  // Mireds, not kelvin: the cubic gives about 6504 K at D65.
  EXPECT_EQ(MiredsOf(255, 255, 255), 153);
  EXPECT_EQ(MiredsOf(128, 128, 128), 153);
  // Black is 0 / 0 in chromaticity: a fixed value instead of undefined behaviour.
  EXPECT_EQ(MiredsOf(0, 0, 0), std::numeric_limits<int64_t>::min());
}

TEST(AutoWhiteBalanceRates, MeasureTheChangeOfTheMeans) {
  const int w = 5, h = 3;
  const std::vector<uint8_t> grey = Flat(w, h, 128, 128, 128), blue = Flat(w, h, 197, 98, 63),
                             magenta = Flat(w, h, 192, 46, 229), warm = Flat(w, h, 90, 140, 200),
                             black = Flat(w, h, 0, 0, 0), red100 = Flat(w, h, 7, 7, 100),
                             red50 = Flat(w, h, 7, 7, 50);
  // Equal images measure exactly 0, black ones included.
  for (const auto* image : {&grey, &warm, &black}) {
    EXPECT_EQ(getAutoWhiteBalanceCCTChangeRate(image->data(), image->data(), w, h), 0.0);
    EXPECT_EQ(getAutoWhiteBalanceTintChangeRate(image->data(), image->data(), w, h), 0.0);
  }
  // Unsaturated: the mired difference over 11500, times 10000.
  const double expected = double(MiredsOf(200, 140, 90) - 153) / 11500.0 * 10000.0;
  EXPECT_DOUBLE_EQ(getAutoWhiteBalanceCCTChangeRate(grey.data(), warm.data(), w, h), expected);
  // These two lie millions of mireds from grey: the rate stops at +/-10000.
  EXPECT_EQ(getAutoWhiteBalanceCCTChangeRate(grey.data(), blue.data(), w, h), 10000.0);
  EXPECT_EQ(getAutoWhiteBalanceCCTChangeRate(grey.data(), magenta.data(), w, h), -10000.0);
  // A missing corrected image counts as white, which has grey's chromaticity.
  EXPECT_EQ(getAutoWhiteBalanceCCTChangeRate(grey.data(), nullptr, w, h), 0.0);

  // Tint: the relative change of the red mean, whatever green does.
  EXPECT_EQ(getAutoWhiteBalanceTintChangeRate(red100.data(), red50.data(), w, h), -50.0);
  EXPECT_EQ(getAutoWhiteBalanceTintChangeRate(red50.data(), red100.data(), w, h), 100.0);
  EXPECT_EQ(getAutoWhiteBalanceTintChangeRate(red100.data(), nullptr, w, h), 100.0);
  // A black source divides by 0: any redder result reads 100.
  EXPECT_EQ(getAutoWhiteBalanceTintChangeRate(black.data(), red50.data(), w, h), 100.0);

  // Sizes below 1 read nothing.
  EXPECT_EQ(getAutoWhiteBalanceCCTChangeRate(grey.data(), blue.data(), 0, h), 0.0);
  EXPECT_EQ(getAutoWhiteBalanceTintChangeRate(red100.data(), red50.data(), w, -1), 0.0);
}

TEST(Rgb2Temperature, FindsTheBlackBodyOrEndsItsRange) {
  // Blue 255 searches from 6600 K up (white matches at once: G(6600) is 4/255 from 1); blue 0
  // gives 1000..1800 K only with full red; the rest 1900..6500 K on green and blue.
  const int cases[][4] = {{255, 255, 255, 6600}, {0, 0, 255, 40000}, {255, 108, 0, 1500},
                          {200, 108, 0, 1900},   {0, 0, 0, 1900},    {255, 206, 166, 4000},
                          {0, 128, 128, 6600},   {255, 0, 128, 6600}};
  for (const auto& c : cases) {
    EXPECT_EQ(rgb2temperature(c[0], c[1], c[2]), c[3]) << c[0] << "," << c[1] << "," << c[2];
  }
  EXPECT_GE(rgb2temperature(221, 230, 255), 7700);
  EXPECT_LE(rgb2temperature(221, 230, 255), 8000);
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

}  // namespace
