#include "tessarofx/WhiteBalance.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <climits>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <opencv2/core.hpp>
#include <ostream>
#include <string>
#include <vector>

#include "support/EffectHarness.h"
#include "support/EveryTarget.h"
#include "support/ImageBuilders.h"

namespace {

using tfx_test::Clone;
using tfx_test::EveryColour;
using tfx_test::Image;
using tfx_test::MapPixels;

// Blue, green, red, alpha, for comparisons that print.
std::array<int, 4> Quad(tagRGBQUAD c) { return {c.rgbBlue, c.rgbGreen, c.rgbRed, c.rgbReserved}; }

// Per-pixel forms written from the formulas, run through the accessors.
uint8_t RefClamp(double v) { return static_cast<uint8_t>(v < 0 ? 0 : v > 255 ? 255 : int(v)); }

tagRGBQUAD RefBlackBody(long kelvin) {
  const double x = kelvin < 1000 ? 10.0 : (kelvin > 40000 ? 40000 : kelvin) / 100.0;
  const auto unit = [](double v) { return v < 0 ? 0.0 : v > 1 ? 1.0 : v; };
  double r = 255, g;
  if (x <= 66) {
    g = unit(std::log(x) * 0.3900815787690196 - 0.6318414437886275) * 255;
  } else {
    r = unit(1.292936186062745 * std::pow(x - 60, -0.1332047592)) * 255;
    g = unit(1.1298908608952942 * std::pow(x - 60, -0.0755148492)) * 255;
  }
  const double b = x >= 66   ? 255
                   : x <= 19 ? 0
                             : unit(std::log(x - 10) * 0.543206789110196 - 1.19625408914) * 255;
  return tagRGBQUAD{uint8_t(int(b)), uint8_t(int(g)), uint8_t(int(r)), 0};
}

// The temperature's blend of each channel value, red, green and blue (t not 11500).
struct TemperatureMix {
  int32_t channel[3][256];

  explicit TemperatureMix(long t) {
    const long k = t < 11500 ? 26000 - t : std::max(18100 - t, 1700L);
    const tagRGBQUAD tc = RefBlackBody(k);
    const float target[3] = {tc.rgbRed / 255.0f, tc.rgbGreen / 255.0f, tc.rgbBlue / 255.0f};
    const float w = float(std::fabs(1.0 - k / 11500.0) * 1.7);
    for (int i = 0; i < 3; ++i) {
      for (int ch = 0; ch < 256; ++ch) {
        const int m = uint8_t(int(ch / 255.0f * target[i] * 255.0f));
        channel[i][ch] = RefClamp(m * w + ch * (1.0f - w));
      }
    }
  }
};

void RefTemperature(CxImage* image, long t) {
  if (t == 11500) return;
  const TemperatureMix mix(t);
  MapPixels(image, [&](tagRGBQUAD c) {
    const tagRGBQUAD m{uint8_t(mix.channel[2][c.rgbBlue]), uint8_t(mix.channel[1][c.rgbGreen]),
                       uint8_t(mix.channel[0][c.rgbRed]), 0};
    tagRGBQUAD hsl = CxImage::RGBtoHSL(m);
    hsl.rgbBlue = uint8_t((std::max({c.rgbRed, c.rgbGreen, c.rgbBlue}) +
                           std::min({c.rgbRed, c.rgbGreen, c.rgbBlue})) >>
                          1);
    tagRGBQUAD out = CxImage::HSLtoRGB(hsl);
    out.rgbReserved = c.rgbReserved;
    return out;
  });
}

void RefTint(CxImage* image, float t) {
  if (t == 0) return;
  const int k = int(t * 100) >> 8;
  MapPixels(image, [&](tagRGBQUAD c) {
    const int luma = (117 * c.rgbBlue + 601 * c.rgbGreen + 306 * c.rgbRed) >> 10;
    c.rgbRed = ClampToByte(c.rgbRed + ((luma * k) >> 8));
    c.rgbBlue = ClampToByte(c.rgbBlue + ((luma * k) >> 8));
    c.rgbGreen = ClampToByte(c.rgbGreen + ((luma * -k) >> 8));
    return c;
  });
}

void RefWhiteBalance(CxImage* image, float v) {
  if (v == 0) return;
  const float ratio = v / 500;
  const unsigned w = image->GetWidth(), h = image->GetHeight();
  std::vector<int> hist(768), sums(size_t{w} * h);
  for (unsigned y = 0; y < h; ++y) {
    for (unsigned x = 0; x < w; ++x) {
      const tagRGBQUAD c = image->GetPixelColor(x, y, true);
      sums[y * w + x] = c.rgbBlue + c.rgbGreen + c.rgbRed;
      ++hist[sums[y * w + x]];
    }
  }
  int threshold = 0, running = 0;
  for (int i = 767; i >= 0; --i) {
    running += hist[i];
    if (float(running) > ratio * float(w) * float(h)) {
      threshold = i;
      break;
    }
  }
  long long r = 0, g = 0, b = 0, n = 0;
  for (unsigned i = 0; i < w * h; ++i) {
    if (sums[i] <= threshold) continue;
    const tagRGBQUAD c = image->GetPixelColor(i % w, i / w, true);
    r += c.rgbRed, g += c.rgbGreen, b += c.rgbBlue, ++n;
  }
  const long long ar = r ? r / n : 0, ag = g ? g / n : 0, ab = b ? b / n : 0;
  const auto scale = [](int ch, long long avg) {
    return uint8_t(avg == 0 ? ch : std::min<long long>(ch * 255 / avg, 255));
  };
  MapPixels(image, [&](tagRGBQUAD c) {
    return tagRGBQUAD{scale(c.rgbBlue, ab), scale(c.rgbGreen, ag), scale(c.rgbRed, ar),
                      c.rgbReserved};
  });
}

struct Operation {
  const char* name;
  void (*run)(CxImage*, double);
  void (*reference)(CxImage*, double);
  double typical;
  std::vector<double> sweep;
};

// Temperature: far below neutral (K above 40000 and a weight above 1.7), both sides of the jump
// at 11500, and the 1700 K floor. Tint: the range ends and a negative k whose shifts round
// differently for red and green. Balance: a sliver of the brightest colours and most of them.
const Operation kTemperature = {"Temperature",
                                [](CxImage* i, double t) { temperatureAdjustment(i, long(t)); },
                                [](CxImage* i, double t) { RefTemperature(i, long(t)); },
                                4000,
                                {-30000, 11499, 11501, 40000}};
const Operation kTint = {"Tint",
                         [](CxImage* i, double t) { tintAdjustment(i, float(t)); },
                         [](CxImage* i, double t) { RefTint(i, float(t)); },
                         -37,
                         {100, -100, -41.3}};
const Operation kBalance = {"WhiteBalance",
                            [](CxImage* i, double v) { whiteBalanceAdjustment(i, float(v)); },
                            [](CxImage* i, double v) { RefWhiteBalance(i, float(v)); },
                            40,
                            {1, 450}};
const Operation* const kOperations[] = {&kTemperature, &kTint, &kBalance};

class WhiteBalanceSweep : public testing::TestWithParam<const Operation*> {};

// Packed frames take the temperature through the relight kernels of the set in force.
TEST_P(WhiteBalanceSweep, MatchesThePerPixelForm) {
  for (const double strength : GetParam()->sweep) {
    SCOPED_TRACE(strength);
    const Image expected = Clone(EveryColour());
    GetParam()->reference(expected.get(), strength);
    const auto check = [&] {
      const Image actual = Clone(EveryColour());
      GetParam()->run(actual.get(), strength);
      EXPECT_TRUE(tfx_test::SameBuffer(*expected, *actual));
    };
    GetParam() == &kTemperature ? tfx_test::ForEveryTarget(check) : check();
  }
}

INSTANTIATE_TEST_SUITE_P(EveryColour, WhiteBalanceSweep, testing::ValuesIn(kOperations),
                         [](const testing::TestParamInfo<const Operation*>& p) {
                           return std::string(p.param->name);
                         });

// RGBA frames take the kernels with the channels swapped; 67 pixels leave a tail on any vector.
TEST(WhiteBalance, OtherLayoutsAndPaddedRowsMatchThePerPixelForm) {
  tfx_test::ForEveryTarget([&] {
    for (const tfx_test::Layout& layout : tfx_test::kLayouts) {
      for (const Operation* op : kOperations) {
        SCOPED_TRACE(testing::Message()
                     << op->name << ' ' << layout.bpp << " bpp " << layout.format);
        EXPECT_TRUE(tfx_test::SameResult(
            *tfx_test::NoiseImage(layout, 67, 9, 12, 9),
            [&](CxImage* i) { op->run(i, op->typical); },
            [&](CxImage* i) { op->reference(i, op->typical); }));
      }
    }
  });
}

TEST(WhiteBalance, BalanceCountsFromTheTopSumAndLeavesBlackAlone) {
  std::vector<int> hist(768, 0);
  hist[767] = 2, hist[700] = 3, hist[10] = 5;
  // 10 pixels: a share of 0.2 (2 pixels) is not exceeded until 700; all of them never are.
  EXPECT_EQ(calThreshold(hist.data(), 5, 2, 0.2f), 700);
  EXPECT_EQ(calThreshold(hist.data(), 5, 2, 1.0f), 0);
  EXPECT_EQ(calThreshold(nullptr, 5, 2, 0.2f), 0);
  CxImage black(6, 3, 32, IPF_BGRA);
  std::memset(black.GetBits(), 0, black.GetSize());
  whiteBalanceAdjustment(&black, 100.0f);  // no average to divide by
  EXPECT_EQ(*std::max_element(black.GetBits(), black.GetBits() + black.GetSize()), 0);
}

// The gradient runs from 30000 K down past 0, where below 1000 K takes that end.
TEST(WhiteBalance, BlackBodyColoursFollowTheFormulaAndFillTheGradient) {
  const std::unique_ptr<CxImage> gradient(createTemperateColor(301, 3));
  ASSERT_NE(gradient, nullptr);
  EXPECT_EQ(gradient->GetWidth(), 301u);
  EXPECT_EQ(gradient->GetBpp(), 24u);
  EXPECT_EQ(gradient->getFormat(), IPF_RGB);
  for (unsigned y = 0; y < 3; ++y) {
    const uint8_t* row = gradient->GetBits() + y * gradient->GetEffWidth();
    for (int x = 0; x < 301; ++x) {
      // Stored blue, green, red whatever the tag says.
      const tagRGBQUAD c = RefBlackBody(30000 - 100 * x);
      ASSERT_EQ(std::memcmp(row + 3 * x, &c, 3), 0) << x;
    }
  }
  // Sizes of nothing, and 2^32 pixels, whose bytes do not fit 32 bits.
  for (const auto& size :
       {std::pair{0, 5}, std::pair{5, 0}, std::pair{-3, 2}, std::pair{65536, 65536}}) {
    const std::unique_ptr<CxImage> empty(createTemperateColor(size.first, size.second));
    ASSERT_NE(empty, nullptr);
    EXPECT_EQ(empty->GetBits(), nullptr);
    EXPECT_EQ(empty->getFormat(), IPF_None);
  }
}

// The blend helper the temperature tables do not use, and the tint helper, which the image
// function reaches only with k, -k, k and ints in range.
TEST(WhiteBalance, PerPixelHelpersKeepTheirChannelsAndSaturateWithoutOverflow) {
  const tagRGBQUAD c{10, 100, 200, 77};
  EXPECT_EQ(Quad(mixColorAndTmpColor(c, tagRGBQUAD{250, 0, 100, 3}, 0.5f)),
            Quad({130, 50, 150, 77}));
  EXPECT_EQ(Quad(calNewTintPixel(c, INT_MAX, INT_MIN, 0)), Quad({10, 0, 255, 77}));
  // t * 100 beyond the int range converts as INT_MIN, the strongest green, without overflow.
  CxImage image(1, 1, 32, IPF_BGRA);
  image.SetPixelColor(0, 0, tagRGBQUAD{90, 90, 90, 1});
  tintAdjustment(&image, 1e30f);
  EXPECT_EQ(Quad(image.GetPixelColor(0, 0, true)), Quad({0, 255, 0, 1}));
}

TEST(AdjustWhiteBalance, ScalesByTheTemperatureAndTintFactors) {
  AdjustWhiteBalance balance;
  // 3 channels, no alpha to copy; a = 0.25, b = -0.5: blue x 0.5, green x 1.5, red x 1.
  std::vector<uint8_t> bytes = {100, 100, 100, 200, 171, 7, 0, 255, 255};
  cv::Mat rgb(1, 3, CV_8UC3, bytes.data());
  cv::Mat out(1, 3, CV_8UC3);
  ASSERT_TRUE(balance.Process(rgb, out, ColorGain{5, 5, 5}, 0.25f, -0.5f));
  const std::vector<uint8_t> expected = {50, 150, 100, 100, 255, 7, 0, 255, 255};
  EXPECT_EQ(std::vector<uint8_t>(out.data, out.data + 9), expected);

  // In place, with a destination smaller than the source: only its pixels are written.
  std::vector<uint8_t> frame = {10, 20, 30, 40, 50, 60, 70, 80};
  std::vector<uint8_t> small = {1, 1, 1, 1};
  cv::Mat in(1, 2, CV_8UC4, frame.data());
  cv::Mat one(1, 1, CV_8UC4, small.data());
  balance.Process(in, one, ColorGain{1, 1, 1}, 1.0f, 0.0f);
  EXPECT_EQ(small, (std::vector<uint8_t>{0, 20, 60, 40}));
  balance.Process(in, in, ColorGain{1, 1, 1}, 0.0f, 1.0f);
  EXPECT_EQ(frame, (std::vector<uint8_t>{15, 0, 45, 40, 75, 0, 105, 80}));

  // Nothing to do for matrices it cannot read.
  cv::Mat empty, grey(2, 2, CV_8UC1, cv::Scalar(9));
  EXPECT_TRUE(balance.Process(empty, grey, ColorGain{1, 1, 1}, 1.0f, 1.0f));
  EXPECT_TRUE(balance.Process(grey, grey, ColorGain{1, 1, 1}, 1.0f, 1.0f));
  EXPECT_EQ(grey.at<uint8_t>(1, 1), 9);
}

// Factor in double then float, product in float, truncated and limited: every colour through the
// host path, at both signs, the range ends and far past them (negative and above-2 factors).
TEST(WhiteBalanceAdjustEffect, EveryColourMatchesTheFactors) {
  const CxImage& all = EveryColour();
  const int height = static_cast<int>(all.GetHeight());
  const tfx_test::Bytes in(all.GetBits(), all.GetBits() + all.GetSize());
  NLEComPtr<INLECGFilter> filter = tfx_test::CreateEffect(
      tfx_test::kWhiteBalance, tfx_test::Settings({{L"u_temperature", 0}, {L"u_tint", 0}}));
  const double settings[][2] = {{100, 0}, {-100, 37}, {0, -100}, {-33.3, 71.1}, {-900, 650}};
  for (const auto& s : settings) {
    SCOPED_TRACE(testing::Message() << "temperature " << s[0] << " tint " << s[1]);
    tfx_test::SetParam(filter.get(), L"u_temperature", s[0]);
    tfx_test::SetParam(filter.get(), L"u_tint", s[1]);
    const tfx_test::Bytes out = tfx_test::RunFrame(filter.get(), new TestFrame(4096, height, in),
                                                   new TestFrame(4096, height));
    const float a = static_cast<float>(s[0] / 200.0), b = static_cast<float>(s[1] / 200.0);
    const double factors[3] = {1 + 0.5 * b - a, 1 - b, 1 + 0.5 * b + a};
    uint8_t table[4][256];
    for (int v = 0; v < 256; ++v) {
      for (int c = 0; c < 3; ++c) {
        const float p = static_cast<float>(factors[c]) * static_cast<float>(v);
        table[c][v] = static_cast<uint8_t>(!(p > 0) ? 0 : p >= 255 ? 255 : int(p));
      }
      table[3][v] = static_cast<uint8_t>(v);
    }
    for (size_t i = 0; i < in.size(); ++i) {
      if (out[i] != table[i % 4][in[i]]) FAIL() << "pixel " << i / 4 << " byte " << i % 4;
    }
  }
}

}  // namespace
