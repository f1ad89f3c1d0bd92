#include "tessarofx/ColorAdjust.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <climits>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <string>
#include <vector>

#include "adjust/ColorAdjustRows.h"
#include "support/EveryTarget.h"
#include "support/ImageBuilders.h"

namespace {

using tfx_test::Clone;
using tfx_test::EveryColour;
using tfx_test::Image;
using tfx_test::NoiseBytes;
using tfx_test::NoiseImage;
using tfx_test::SameBuffer;
using tfx_test::SameResult;

// Per-pixel references written from the formulas alone, sharing no code with the library.
template <class Fn>
void EveryPixel(CxImage* image, Fn fn) {
  tfx_test::MapPixels(image, [&](tagRGBQUAD c) {
    uint8_t* channels[3] = {&c.rgbBlue, &c.rgbGreen, &c.rgbRed};
    fn(channels);
    return c;
  });
}

uint8_t FloorAndCap(float v) {
  if (v < 0) return 0;
  return static_cast<uint8_t>(static_cast<int>(std::min(255.0f, v)));
}

void ReferenceExposure(CxImage* image, float e) {
  if (e == 0) return;
  const float gain = static_cast<float>(std::pow(2.0, e / 50.0 * 0.6));
  EveryPixel(image, [&](uint8_t* const* ch) {
    for (int i = 0; i < 3; ++i) *ch[i] = FloorAndCap(*ch[i] * gain);
  });
}

void ReferenceBrightness(CxImage* image, float b) {
  if (b == 0) return;
  const float k = b > 0 ? b / 100.0f + 1.0f
                        : static_cast<float>((1.0 / (b / 253.0 + 0.99) - 1.0) * (-255.0) * 0.6);
  uint8_t* p = image->GetBits();
  const size_t step = image->GetBpp() / 8;
  for (size_t i = 0; i < size_t{image->GetWidth()} * image->GetHeight(); ++i, p += step) {
    for (int j = 0; j < 3; ++j) p[j] = FloorAndCap(k > 0 ? p[j] * k : p[j] + k);
  }
}

void ReferenceContrast(CxImage* image, float c) {
  if (c == 0) return;
  const float t = c > 0 ? 1.0f / (1.0f - c / 255.0f) - 1.0f : c / 255.0f;
  // Outside int's range (t is infinite at c = 255) x86 truncation gives INT_MIN.
  const float scaled = t * 100.0f * 0.5f;
  int lo = scaled >= -2147483648.0f && scaled < 2147483648.0f ? static_cast<int>(scaled) : INT_MIN;
  int hi = 0;
  if (255 - int64_t{lo} < lo) {
    lo = 120;
    hi = 127;
  } else if (lo < -127) {
    lo = -120;
  } else {
    hi = 255 - lo;
  }
  const int d = lo < 0 ? 255 + 2 * lo : 255 - 2 * lo;
  EveryPixel(image, [&](uint8_t* const* ch) {
    for (int i = 0; i < 3; ++i) {
      const int v = *ch[i];
      *ch[i] = static_cast<uint8_t>(lo < 1    ? v * d / 255 - lo
                                    : v <= lo ? 0
                                    : v > hi  ? 255
                                              : (v - lo) * 255 / d);
    }
  });
}

void ReferenceVibrance(CxImage* image, float v) {
  if (v == 0) return;
  const float strength = static_cast<float>(v / 100.0f * 0.8);
  EveryPixel(image, [&](uint8_t* const* ch) {
    const int luma = (std::min({*ch[0], *ch[1], *ch[2]}) + std::max({*ch[0], *ch[1], *ch[2]})) >> 1;
    int mask[3];
    for (int i = 0; i < 3; ++i) mask[i] = std::clamp(*ch[i] - luma, 0, 255);
    const int maskLuma =
        (std::min({mask[0], mask[1], mask[2]}) + std::max({mask[0], mask[1], mask[2]})) >> 1;
    const uint8_t amount = static_cast<uint8_t>(-maskLuma);
    const int k = static_cast<int>(amount * strength);
    for (int i = 0; i < 3; ++i) {
      *ch[i] = static_cast<uint8_t>(std::clamp((*ch[i] * (k + 256) - luma * k) >> 8, 0, 255));
    }
  });
}

void ReferenceSaturation(CxImage* image, float s) {
  if (s == 0) return;
  const float sigma = s / 100.0f;
  EveryPixel(image, [&](uint8_t* const* ch) {
    const int mx = std::max({*ch[0], *ch[1], *ch[2]});
    const int mn = std::min({*ch[0], *ch[1], *ch[2]});
    if (mx == mn) return;
    const float sum = (mx + mn) / 255.0f, l = sum / 2, delta = (mx - mn) / 255.0f, lv = l * 255;
    const float sat = l < 0.5f ? delta / sum : delta / (2 - sum);
    const float a = sat + sigma >= 1 ? 1 / sat - 1 : 1 / (1 - sigma) - 1;
    for (int i = 0; i < 3; ++i) {
      const float c = *ch[i];
      *ch[i] = FloorAndCap(sigma >= 0 ? c + (c - lv) * a : lv + (c - lv) * (1 + sigma));
    }
  });
}

struct Operation {
  const char* name;
  CxImage* (*fast)(CxImage*, float, const tfx::ColorAdjustRows&);
  CxImage* (*exported)(CxImage*, float);
  void (*reference)(CxImage*, float);
  float typical;  // for the sweeps over layouts
  // Both signs, the extremes and every branch point. Contrast 1 gives lo = 0, 183 lo = 127 with
  // d = 1, 184 the clamped lo (120, d = 15), -255 lo = -50; 255 (t infinite) and 300 (t < 0) put
  // lo below -127. Brightness -0.01 already darkens by 1.55 levels.
  std::vector<float> sweep;
};

const Operation kOperations[] = {
    {"Exposure",
     tfx::ExposureAdjust,
     exposureAdjustment,
     ReferenceExposure,
     70,
     {50, -50, 100, -100}},
    {"Brightness",
     tfx::BrightnessAdjust,
     brightnessAdjustment,
     ReferenceBrightness,
     -37,
     {100, 33.3f, -0.5f, -0.01f, -100}},
    {"Contrast",
     tfx::ContrastAdjust,
     contrastAdjustment,
     ReferenceContrast,
     61,
     {1, 100, 183, 184, -60, -255, 255, 300}},
    {"Vibrance", tfx::VibranceAdjust, vibranceAdjustment, ReferenceVibrance, 70, {100, 37, -100}},
    {"Saturation",
     tfx::SaturationAdjust,
     saturationAdjustment,
     ReferenceSaturation,
     45,
     {100, 50, -50, -100}}};
const Operation* const kBrightness = &kOperations[1];

class AllColours : public testing::TestWithParam<Operation> {};

TEST_P(AllColours, MatchesReferenceOnEveryKernelSet) {
  const Operation& op = GetParam();
  for (const float strength : op.sweep) {
    const Image expected = Clone(EveryColour());
    op.reference(expected.get(), strength);
    tfx_test::ForEveryTarget([&] {
      const tfx::ColorAdjustRows* const rows = &tfx::BestColorAdjustRows();
      SCOPED_TRACE(testing::Message() << "strength " << strength);
      const Image actual = Clone(EveryColour());
      EXPECT_EQ(op.fast(actual.get(), strength, *rows), actual.get());
      EXPECT_TRUE(SameBuffer(*expected, *actual));
    });
  }
}

INSTANTIATE_TEST_SUITE_P(ColorAdjust, AllColours, testing::ValuesIn(kOperations),
                         [](const testing::TestParamInfo<Operation>& p) { return p.param.name; });

TEST(ColorAdjustPlan, OnePassEqualsTheFiveOperationsInTurn) {
  // Both saturation forms, a lowering vibrance, the clamped contrast ramp, and a saturation so far
  // past -100 that results overshoot the int32 range. Wrapping vibrance products and a NaN
  // saturation must not fuse: they run the kernels tested above in turn.
  const struct {
    float e, b, c, v, s;
  } cases[] = {{20, 15, 30, 40, 25}, {0, 0, 0, -100, -60}, {-40, -3, 184, 100, 100},
               {0, 0, 0, 0, -100},   {0, 0, 0, 40, 0},     {20, 15, 30, 0, 0},
               {0, 0, 0, 40, -1e10f}};
  for (const auto& c : cases) {
    const Image expected = Clone(EveryColour());
    ReferenceExposure(expected.get(), c.e);
    ReferenceBrightness(expected.get(), c.b);
    ReferenceContrast(expected.get(), c.c);
    ReferenceVibrance(expected.get(), c.v);
    ReferenceSaturation(expected.get(), c.s);
    tfx_test::ForEveryTarget([&] {
      SCOPED_TRACE(testing::Message()
                   << c.e << ' ' << c.b << ' ' << c.c << ' ' << c.v << ' ' << c.s);
      const tfx::ColorAdjustPlan plan(c.e, c.b, c.c, c.v, c.s, tfx::BestColorAdjustRows());
      EXPECT_TRUE(plan.Fused());
      const Image actual = Clone(EveryColour());
      plan.ApplyInto(actual->GetBits(), EveryColour().GetBits(),
                     size_t{actual->GetWidth()} * actual->GetHeight());
      ASSERT_TRUE(SameBuffer(*expected, *actual));
      // In place, ending inside a block of the tone pass and inside a vector; nothing beyond.
      const size_t odd = 1000 * 1000 + 3;
      const Image inPlace = Clone(EveryColour());
      plan.ApplyInto(inPlace->GetBits(), inPlace->GetBits(), odd);
      ASSERT_EQ(0, std::memcmp(inPlace->GetBits(), expected->GetBits(), odd * 4));
      ASSERT_EQ(0,
                std::memcmp(inPlace->GetBits() + odd * 4, EveryColour().GetBits() + odd * 4, 64));
    });
  }
  const tfx::ColorAdjustRows& best = tfx::BestColorAdjustRows();
  EXPECT_FALSE(tfx::ColorAdjustPlan(10, 0, -60, 1e9f, 10, best).Fused());
  EXPECT_FALSE(tfx::ColorAdjustPlan(0, 0, 0, 30, std::nanf(""), best).Fused());
}

tagRGBQUAD VibranceByPixel(tagRGBQUAD c, float strength) {
  const unsigned char luma = calLuma(c);
  return mixLumaAndColor(c, luma, static_cast<unsigned char>(-calLuma(calMask(c, luma))), strength);
}

TEST(ColorAdjustRows, MatchThePerPixelFormsAtExtremeStrengths) {
  // Far past what the operations pass, where the kernels switch to wrap-around and NaN-safe
  // forms. Greys, then (v, v / 2 + 64, 128), whose middle channel can meet l * 255 exactly (NaN
  // under an infinite gain), then noise; 4101 pixels leave a tail on every vector width.
  constexpr float kInf = std::numeric_limits<float>::infinity();
  constexpr float kNan = std::numeric_limits<float>::quiet_NaN();
  std::vector<uint8_t> noise = NoiseBytes(4101 * 4, 77);
  for (int v = 0; v < 256; ++v) {
    const uint8_t grey[3] = {uint8_t(v), uint8_t(v), uint8_t(v)};
    const uint8_t steps[3] = {uint8_t(v), uint8_t(v / 2 + 64), uint8_t(128)};
    std::memcpy(&noise[4 * v], grey, 3);
    std::memcpy(&noise[4 * (256 + v)], steps, 3);
  }
  const auto check = [&](float strength, auto kernel, auto byPixel) {
    std::vector<uint8_t> expected = noise;
    for (size_t i = 0; i < expected.size(); i += 4) {
      tagRGBQUAD c;
      std::memcpy(&c, &expected[i], 4);
      c = byPixel(c, strength);
      std::memcpy(&expected[i], &c, 4);
    }
    tfx_test::ForEveryTarget([&] {
      SCOPED_TRACE(strength);
      std::vector<uint8_t> actual = noise;
      (tfx::BestColorAdjustRows().*kernel)(actual.data(), actual.size() / 4, strength);
      ASSERT_EQ(actual, expected);
    });
  };
  for (const float strength :
       {16448.0f, 16449.0f, -16449.0f, 8.5e6f, -8.5e6f, 1e30f, kInf, -kInf, kNan}) {
    check(strength, &tfx::ColorAdjustRows::vibrance, VibranceByPixel);
  }
  for (const float sigma : {1.0f, 0.999f, 2.0f, 1e30f, kInf, -1e30f, -3.4e38f, -kInf, kNan}) {
    check(sigma, &tfx::ColorAdjustRows::saturation, calNewColor);
  }
}

// Every tail length, into another buffer (whose bytes past the pixels stay) and in place. Random
// tables catch a lookup that only works for ordered entries; gains of every sign and size, NaN
// included, each on its own channel.
TEST(ColorAdjustRows, TableAndGainKernelsMatchTheirByteForms) {
  const auto check = [](auto kernel, const auto* argument, auto pixel) {
    tfx_test::ForEveryTarget([&] {
      for (size_t count : {0, 1, 7, 8, 15, 16, 17, 33, 300, 4099}) {
        SCOPED_TRACE(count);
        std::vector<uint8_t> src = NoiseBytes(count * 4 + 8, uint32_t(count)), expected = src;
        for (size_t i = 0; i < count; ++i) pixel(&expected[4 * i]);
        std::vector<uint8_t> apart = NoiseBytes(src.size(), 77), expectedApart = apart;
        std::copy_n(expected.begin(), 4 * count, expectedApart.begin());
        const tfx::ColorAdjustRows& rows = tfx::BestColorAdjustRows();
        (rows.*kernel)(apart.data(), src.data(), count, argument);
        ASSERT_EQ(apart, expectedApart);
        (rows.*kernel)(src.data(), src.data(), count, argument);
        ASSERT_EQ(src, expected);
      }
    });
  };
  constexpr float kNan = std::numeric_limits<float>::quiet_NaN();
  for (const std::array<float, 3> gain : {std::array<float, 3>{0.5f, 1.5f, 1.0f},
                                          {2.0f, 0.0f, -0.25f},
                                          {1.2345f, 0.9876f, 3e9f},
                                          {kNan, -kNan, std::numeric_limits<float>::infinity()}}) {
    SCOPED_TRACE(testing::Message() << "gain " << gain[0] << ' ' << gain[1] << ' ' << gain[2]);
    check(&tfx::ColorAdjustRows::scaleChannels, gain.data(), [&](uint8_t* p) {
      for (int c = 0; c < 3; ++c) p[c] = FloorAndCap(static_cast<float>(p[c]) * gain[c]);
    });
  }
  for (uint32_t salt = 1; salt <= 4; ++salt) {
    SCOPED_TRACE(testing::Message() << "table " << salt);
    const std::vector<uint8_t> table = NoiseBytes(256, salt);
    check(&tfx::ColorAdjustRows::applyTable, table.data(), [&](uint8_t* p) {
      for (int c = 0; c < 3; ++c) p[c] = table[p[c]];
    });
  }
  // The brightest table looks up in the row of the largest channel.
  const std::vector<uint8_t> rowsTable = NoiseBytes(tfx::kBrightestTableBytes, 3);
  check(&tfx::ColorAdjustRows::brightestTable, rowsTable.data(), [&](uint8_t* p) {
    const uint8_t* row = &rowsTable[256 * std::max({p[0], p[1], p[2]})];
    for (int c = 0; c < 3; ++c) p[c] = row[p[c]];
  });
}

TEST(ColorAdjust, MatchesReferenceForEveryLayoutWidthAndPaddedStride) {
  // Widths around every vector size; padding stays untouched except by brightness, whose walk
  // ignores rows (as its reference does). Other layouts go through the exported functions.
  for (const Operation& op : kOperations) {
    tfx_test::ForEveryTarget([&] {
      for (unsigned width = 1; width <= 40; ++width) {
        for (unsigned pad : {0u, 12u}) {
          SCOPED_TRACE(testing::Message() << op.name << " width " << width << " padding " << pad);
          ASSERT_TRUE(SameResult(
              *NoiseImage(width, 3, 32, IPF_BGRA, width * 4 + pad, width),
              [&](CxImage* i) { op.fast(i, op.typical, tfx::BestColorAdjustRows()); },
              [&](CxImage* i) { op.reference(i, op.typical); }));
        }
      }
    });
    for (const tfx_test::Layout& layout : tfx_test::kLayouts) {
      if (&op == kBrightness && layout.bpp < 24) continue;  // overlapping windows, tested below
      SCOPED_TRACE(testing::Message() << op.name << ' ' << layout.bpp << " bpp " << layout.format);
      EXPECT_TRUE(SameResult(
          *NoiseImage(layout, 13, 5, 12, 9),
          [&](CxImage* i) { EXPECT_EQ(op.exported(i, op.typical), i); },
          [&](CxImage* i) { op.reference(i, op.typical); }));
    }
  }
}

TEST(ColorAdjust, ToneAdjustEqualsTheThreeCurvesInTurn) {
  // One composed table on unpadded frames, the three passes elsewhere: the bytes must not tell.
  const float settings[][3] = {{70, -37, 61}, {0, 100, -255}, {-100, 0, 184}, {33.3f, -0.5f, 0}};
  for (const auto& s : settings) {
    for (unsigned pad : {0u, 8u}) {
      SCOPED_TRACE(testing::Message() << s[0] << ' ' << s[1] << ' ' << s[2] << " pad " << pad);
      ASSERT_TRUE(SameResult(
          *NoiseImage(37, 5, 32, IPF_BGRA, 37 * 4 + pad, 11),
          [&](CxImage* i) { tfx::ToneAdjust(i, s[0], s[1], s[2], tfx::BestColorAdjustRows()); },
          [&](CxImage* i) {
            ReferenceExposure(i, s[0]);
            ReferenceBrightness(i, s[1]);
            ReferenceContrast(i, s[2]);
          }));
    }
  }
}

TEST(ColorAdjust, OnePixelFormsAndNarrowBrightnessKeepTheirLimits) {
  // Brightness on one-byte pixels: three-byte windows overlap and stop at the buffer's end.
  std::vector<uint8_t> grey(4, 10);
  uint8_t* bits = grey.data();
  CxImage narrow(&bits, 4, 1, 8, 4, IPF_Gray8);
  brightnessAdjustment(&narrow, 100.0f);
  EXPECT_EQ(grey, (std::vector<uint8_t>{20, 40, 80, 80}));

  const tagRGBQUAD c{10, 200, 50, 100};  // blue, green, red, alpha
  // calPowColor floors at 0, which the image function's positive gain never needs.
  const tagRGBQUAD dark = calPowColor(c, -2.0f);
  EXPECT_EQ(dark.rgbBlue + dark.rgbGreen + dark.rgbRed, 0);
  EXPECT_EQ(dark.rgbReserved, 100);
  // calMask masks alpha as well.
  const tagRGBQUAD mask = calMask(c, 60);
  EXPECT_EQ(mask.rgbBlue + mask.rgbRed, 0);
  EXPECT_EQ(mask.rgbGreen, 140);
  EXPECT_EQ(mask.rgbReserved, 40);
}

}  // namespace
