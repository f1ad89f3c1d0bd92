#include "tessarofx/ColorAdjust.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <iostream>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include <hwy/targets.h>

#include "adjust/ColorAdjustReference.h"
#include "adjust/ColorAdjustRows.h"

namespace {

using tfx_test::Clone;
using tfx_test::EveryColour;
using tfx_test::Image;
using tfx_test::NoiseBytes;
using tfx_test::NoiseImage;
using tfx_test::SameBuffer;

struct Operation {
  const char* name;
  CxImage* (*fast)(CxImage*, float, const tfx::ColorAdjustRows&);
  CxImage* (*exported)(CxImage*, float);
  void (*reference)(CxImage*, float);
  float typical;  // for the tests that sweep layouts rather than strengths
  // Both signs, the extremes and the points where the formulas change branch. Contrast 1 gives
  // lo = 0 (compression with d = 255), 100 a stretch, 184 the clamped lo.
  std::vector<float> sweep;
};

const Operation kExposure = {
    "Exposure", tfx::ExposureAdjust, exposureAdjustment, tfx_test::ReferenceExposure,
    70.0f,      {50, -50, 100, -100}};
const Operation kBrightness = {
    "Brightness", tfx::BrightnessAdjust,    brightnessAdjustment, tfx_test::ReferenceBrightness,
    -37.0f,       {100, 33.3f, -0.5f, -100}};
const Operation kContrast = {
    "Contrast", tfx::ContrastAdjust,     contrastAdjustment, tfx_test::ReferenceContrast,
    61.0f,      {1, 100, 184, -60, -255}};
const Operation kVibrance = {
    "Vibrance", tfx::VibranceAdjust, vibranceAdjustment, tfx_test::ReferenceVibrance,
    70.0f,      {100, 37, -100}};
const Operation kSaturation = {
    "Saturation", tfx::SaturationAdjust, saturationAdjustment, tfx_test::ReferenceSaturation,
    45.0f,        {100, 50, -50, -100}};
const Operation* const kOperations[] = {&kExposure, &kBrightness, &kContrast, &kVibrance,
                                        &kSaturation};

class AllColours : public testing::TestWithParam<const Operation*> {};

TEST_P(AllColours, MatchesReferenceOnEveryKernelSet) {
  const Operation& op = *GetParam();
  for (const float strength : op.sweep) {
    const Image expected = Clone(EveryColour());
    op.reference(expected.get(), strength);
    for (const tfx::ColorAdjustRows* rows : tfx::SupportedColorAdjustRows()) {
      SCOPED_TRACE(testing::Message() << rows->name << " strength " << strength);
      const Image actual = Clone(EveryColour());
      EXPECT_EQ(op.fast(actual.get(), strength, *rows), actual.get());
      EXPECT_TRUE(SameBuffer(*expected, *actual));
    }
  }
}

INSTANTIATE_TEST_SUITE_P(ColorAdjust, AllColours, testing::ValuesIn(kOperations),
                         [](const testing::TestParamInfo<const Operation*>& p) {
                           return std::string(p.param->name);
                         });

TEST(ColorAdjustPlan, OnePassEqualsTheFiveOperationsInTurn) {
  // Every colour, on every kernel set. The settings cover both saturation forms, a vibrance that
  // lowers, and the clamped contrast ramp. A vibrance whose products wrap and a NaN saturation
  // must not fuse; they run the kernels tested above one after the other.
  const struct {
    float e, b, c, v, s;
  } cases[] = {{20, 15, 30, 40, 25}, {0, 0, 0, -100, -60}, {-40, -3, 184, 100, 100},
               {0, 0, 0, 0, -100},   {0, 0, 0, 40, 0},     {20, 15, 30, 0, 0}};
  for (const auto& c : cases) {
    const Image expected = Clone(EveryColour());
    tfx_test::ReferenceExposure(expected.get(), c.e);
    tfx_test::ReferenceBrightness(expected.get(), c.b);
    tfx_test::ReferenceContrast(expected.get(), c.c);
    tfx_test::ReferenceVibrance(expected.get(), c.v);
    tfx_test::ReferenceSaturation(expected.get(), c.s);
    for (const tfx::ColorAdjustRows* rows : tfx::SupportedColorAdjustRows()) {
      SCOPED_TRACE(testing::Message() << rows->name << ' ' << c.e << ' ' << c.b << ' ' << c.c << ' '
                                      << c.v << ' ' << c.s);
      const tfx::ColorAdjustPlan plan(c.e, c.b, c.c, c.v, c.s, *rows);
      EXPECT_TRUE(plan.Fused());
      // From the source into another image, as the effect runs it.
      const Image actual = Clone(EveryColour());
      plan.ApplyInto(actual->GetBits(), EveryColour().GetBits(),
                     size_t{actual->GetWidth()} * actual->GetHeight());
      ASSERT_TRUE(SameBuffer(*expected, *actual));
    }
  }
  const tfx::ColorAdjustRows& best = tfx::BestColorAdjustRows();
  EXPECT_FALSE(tfx::ColorAdjustPlan(10, 0, -60, 1e9f, 10, best).Fused());
  EXPECT_FALSE(tfx::ColorAdjustPlan(0, 0, 0, 30, std::nanf(""), best).Fused());
}

TEST(ColorAdjustRows, OneSetPerTargetCompiledAndSupported) {
  // Every test that loops over the sets then covers every Highway target this machine runs.
  std::vector<std::string> expected;
  for (const int64_t target : hwy::SupportedAndGeneratedTargets()) {
    expected.push_back(hwy::TargetName(target));
  }
  std::vector<std::string> names;
  std::string list;
  for (const tfx::ColorAdjustRows* rows : tfx::SupportedColorAdjustRows()) {
    names.push_back(rows->name);
    list += ' ' + names.back();
  }
  std::cout << "[ targets  ]" << list << std::endl;
  EXPECT_EQ(names, expected);
  ASSERT_FALSE(names.empty());
  const tfx::ColorAdjustRows& best = tfx::BestColorAdjustRows();
  const tfx::ColorAdjustRows& first = *tfx::SupportedColorAdjustRows().front();
  EXPECT_STREQ(best.name, first.name);
  EXPECT_EQ(best.applyTable, first.applyTable);
  EXPECT_EQ(best.vibrance, first.vibrance);
  EXPECT_EQ(best.saturation, first.saturation);
}

tagRGBQUAD VibranceByPixel(tagRGBQUAD c, float strength) {
  const unsigned char luma = calLuma(c);
  const auto mask = static_cast<unsigned char>(-calLuma(calMask(c, luma)));
  return mixLumaAndColor(c, luma, mask, strength);
}

TEST(ColorAdjustRows, MatchThePerPixelFormsAtExtremeStrengths) {
  // Far outside what the operations pass, where the reference's ints would overflow: the kernels
  // switch to their wrap-around and NaN-safe forms around the thresholds below, and must still
  // give the bytes of the per-pixel forms. Greys, then (v, (v + 128) / 2, 128), whose middle
  // channel can meet l * 255 exactly, which an infinite gain turns into NaN, then noise; 4101
  // pixels leave a tail on every vector width.
  constexpr float kInf = std::numeric_limits<float>::infinity();
  constexpr float kNan = std::numeric_limits<float>::quiet_NaN();
  std::vector<uint8_t> noise = NoiseBytes(4101 * 4, 77);
  for (int v = 0; v < 256; ++v) {
    const uint8_t grey[3] = {uint8_t(v), uint8_t(v), uint8_t(v)};
    const uint8_t steps[3] = {uint8_t(v), uint8_t(v / 2 + 64), uint8_t(128)};
    std::memcpy(&noise[4 * v], grey, 3);
    std::memcpy(&noise[4 * (256 + v)], steps, 3);
  }
  const float strengths[] = {16448.0f, 16449.0f, -16449.0f, 8.5e6f, -8.5e6f,
                             1e30f,    kInf,     -kInf,     kNan};
  const float sigmas[] = {1.0f, 0.999f, 2.0f, 1e30f, kInf, -1e30f, -3.4e38f, -kInf, kNan};
  const auto check = [&](const char* label, float strength, auto kernel, auto by_pixel) {
    std::vector<uint8_t> expected = noise;
    for (size_t i = 0; i < expected.size(); i += 4) {
      tagRGBQUAD c;
      std::memcpy(&c, &expected[i], 4);
      c = by_pixel(c, strength);
      std::memcpy(&expected[i], &c, 4);
    }
    for (const tfx::ColorAdjustRows* rows : tfx::SupportedColorAdjustRows()) {
      SCOPED_TRACE(testing::Message() << rows->name << ' ' << label << ' ' << strength);
      std::vector<uint8_t> actual = noise;
      (rows->*kernel)(actual.data(), actual.size() / 4, strength);
      ASSERT_EQ(actual, expected);
    }
  };
  for (const float strength : strengths) {
    check("vibrance", strength, &tfx::ColorAdjustRows::vibrance, VibranceByPixel);
  }
  for (const float sigma : sigmas) {
    check("saturation", sigma, &tfx::ColorAdjustRows::saturation, calNewColor);
  }
}

TEST(ColorAdjustRows, ScaleChannelsLimitsEachProductLikeTheByteForm) {
  // Gains of every sign and size, NaN included, each on its own channel; src and dst apart and
  // the same buffer; counts that leave tails.
  constexpr float kNan = std::numeric_limits<float>::quiet_NaN();
  const float gains[][3] = {{0.5f, 1.5f, 1.0f},
                            {2.0f, 0.0f, -0.25f},
                            {1.2345f, 0.9876f, 3e9f},
                            {kNan, -kNan, std::numeric_limits<float>::infinity()}};
  const auto byte = [](float v) -> uint8_t {
    if (v < 0.0f) return 0;
    return static_cast<uint8_t>(static_cast<int>(v < 255.0f ? v : 255.0f));
  };
  for (const tfx::ColorAdjustRows* rows : tfx::SupportedColorAdjustRows()) {
    for (const auto& gain : gains) {
      for (size_t count : {1, 17, 4099}) {
        SCOPED_TRACE(testing::Message() << rows->name << " gain " << gain[0] << " count " << count);
        std::vector<uint8_t> src = NoiseBytes(count * 4, 5), expected = src;
        for (size_t i = 0; i < expected.size(); ++i) {
          if (i % 4 != 3) expected[i] = byte(static_cast<float>(expected[i]) * gain[i % 4]);
        }
        std::vector<uint8_t> dst(src.size());
        rows->scaleChannels(dst.data(), src.data(), count, gain);
        ASSERT_EQ(dst, expected);
        rows->scaleChannels(src.data(), src.data(), count, gain);
        ASSERT_EQ(src, expected);
      }
    }
  }
}

TEST(ColorAdjustRows, BrightestTableLooksUpInTheRowOfTheLargestChannel) {
  const std::vector<uint8_t> table = NoiseBytes(tfx::kBrightestTableBytes, 3);
  for (const tfx::ColorAdjustRows* rows : tfx::SupportedColorAdjustRows()) {
    for (size_t count : {1, 17, 4099}) {
      SCOPED_TRACE(testing::Message() << rows->name << " count " << count);
      std::vector<uint8_t> pixels = NoiseBytes(count * 4, 9), expected = pixels;
      for (size_t i = 0; i < expected.size(); i += 4) {
        const uint8_t* row =
            &table[256 * std::max({expected[i], expected[i + 1], expected[i + 2]})];
        for (size_t c = 0; c < 3; ++c) expected[i + c] = row[expected[i + c]];
      }
      std::vector<uint8_t> apart(pixels.size());
      rows->brightestTable(apart.data(), pixels.data(), count, table.data());
      ASSERT_EQ(apart, expected);
      rows->brightestTable(pixels.data(), pixels.data(), count, table.data());
      ASSERT_EQ(pixels, expected);
    }
  }
}

TEST(ColorAdjustRows, TableKernelsMapColourBytesOnly) {
  // Random tables, unlike the monotonic curves of the operations, catch a lookup that only
  // works for ordered entries.
  for (const tfx::ColorAdjustRows* rows : tfx::SupportedColorAdjustRows()) {
    for (uint32_t salt = 1; salt <= 4; ++salt) {
      const std::vector<uint8_t> table = NoiseBytes(256, salt);
      for (size_t count : {0, 1, 7, 8, 15, 16, 17, 33, 300}) {
        SCOPED_TRACE(testing::Message() << rows->name << " table " << salt << " count " << count);
        std::vector<uint8_t> pixels = NoiseBytes(count * 4 + 8, salt + 10);
        std::vector<uint8_t> expected = pixels;
        for (size_t i = 0; i < count * 4; ++i) {
          if (i % 4 != 3) expected[i] = table[expected[i]];
        }
        rows->applyTable(pixels.data(), pixels.data(), count, table.data());
        ASSERT_EQ(pixels, expected);
      }
    }
  }
}

TEST(ColorAdjust, MatchesReferenceForEveryLayoutWidthAndPaddedStride) {
  // Widths around every vector size exercise the tails. Padding must stay untouched by all but
  // brightness, whose walk ignores rows (and the reference walks the same way). Other layouts
  // take the accessors through the exported functions.
  for (const Operation* op : kOperations) {
    for (const tfx::ColorAdjustRows* rows : tfx::SupportedColorAdjustRows()) {
      for (unsigned width = 1; width <= 40; ++width) {
        for (unsigned pad : {0u, 12u}) {
          SCOPED_TRACE(testing::Message() << rows->name << ' ' << op->name << " width " << width
                                          << " padding " << pad);
          const Image actual = NoiseImage(width, 3, 32, IPF_BGRA, width * 4 + pad, width);
          const Image expected = Clone(*actual);
          op->reference(expected.get(), op->typical);
          op->fast(actual.get(), op->typical, *rows);
          ASSERT_TRUE(SameBuffer(*expected, *actual));
        }
      }
    }
    const struct {
      unsigned bpp, effWidth;
      _ImagePixelFormat format;
    } layouts[] = {{24, 40, IPF_BGR},
                   {24, 40, IPF_RGB},
                   {32, 56, IPF_RGBA},
                   {16, 28, IPF_RGB},
                   {8, 16, IPF_Gray8}};
    for (const auto& layout : layouts) {
      // Narrow pixels give brightness overlapping windows; see the walk test below.
      if (op == &kBrightness && layout.bpp < 24) continue;
      SCOPED_TRACE(testing::Message() << op->name << ' ' << layout.bpp << " bpp");
      const Image actual = NoiseImage(13, 5, layout.bpp, layout.format, layout.effWidth, 9);
      const Image expected = Clone(*actual);
      op->reference(expected.get(), op->typical);
      EXPECT_EQ(op->exported(actual.get(), op->typical), actual.get());
      EXPECT_TRUE(SameBuffer(*expected, *actual));
    }
  }
}

TEST(ColorAdjust, ToneAdjustEqualsTheThreeCurvesInTurn) {
  // One composed table on unpadded frames, the three passes elsewhere: the bytes must not tell.
  const float settings[][3] = {{70, -37, 61}, {0, 100, -255}, {-100, 0, 184}, {33.3f, -0.5f, 0}};
  for (const auto& s : settings) {
    for (unsigned pad : {0u, 8u}) {
      SCOPED_TRACE(testing::Message() << s[0] << ' ' << s[1] << ' ' << s[2] << " pad " << pad);
      const Image actual = NoiseImage(37, 5, 32, IPF_BGRA, 37 * 4 + pad, 11);
      const Image expected = Clone(*actual);
      tfx_test::ReferenceExposure(expected.get(), s[0]);
      tfx_test::ReferenceBrightness(expected.get(), s[1]);
      tfx_test::ReferenceContrast(expected.get(), s[2]);
      tfx::ToneAdjust(actual.get(), s[0], s[1], s[2], tfx::BestColorAdjustRows());
      ASSERT_TRUE(SameBuffer(*expected, *actual));
    }
  }
}

TEST(ColorAdjust, FollowsTheCurvesAtTheirLandmarks) {
  const struct {
    const Operation* op;
    float strength;
    int in, out;
  } cases[] = {
      // the smallest darkening is already 1.55 levels
      {&kBrightness, -0.01f, 100, 98},
      // 183: lo = 127, hi = 128, d = 1
      {&kContrast, 183, 127, 0},
      {&kContrast, 183, 128, 255},
      // 184: lo = 120, hi = 127, d = 15; the ramp tops at 119, then jumps
      {&kContrast, 184, 120, 0},
      {&kContrast, 184, 121, 17},
      {&kContrast, 184, 127, 119},
      {&kContrast, 184, 128, 255},
      // -255: lo = -50, d = 155
      {&kContrast, -255, 0, 50},
      {&kContrast, -255, 255, 205},
      // t infinite (255) or negative (300): lo falls below -127 and becomes -120, d = 15
      {&kContrast, 255, 0, 120},
      {&kContrast, 300, 255, 135},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << c.op->name << ' ' << c.strength << " at " << c.in);
    const uint8_t v = static_cast<uint8_t>(c.in);
    CxImage image(1, 1, 32, IPF_BGRA);
    image.SetPixelColor(0, 0, tagRGBQUAD{v, v, v, 200});
    c.op->exported(&image, c.strength);
    const tagRGBQUAD out = image.GetPixelColor(0, 0, true);
    EXPECT_EQ(out.rgbBlue, c.out);
    EXPECT_EQ(out.rgbRed, c.out);
    EXPECT_EQ(out.rgbReserved, 200);
  }
}

TEST(ColorAdjust, BrightnessWalksPixelsIgnoringRowPadding) {
  // 3 x 2 pixels, one 4-byte gap per row: the walk takes 6 consecutive pixels from the first
  // byte, so the first gap is treated as a pixel and the last real pixel is never reached.
  std::vector<uint8_t> frame(32, 100);
  uint8_t* bits = frame.data();
  CxImage image(&bits, 3, 2, 32, 16, IPF_BGRA);
  brightnessAdjustment(&image, 100.0f);
  std::vector<uint8_t> expected(32, 100);
  for (int i = 0; i < 24; ++i) expected[i] = i % 4 == 3 ? 100 : 200;
  EXPECT_EQ(frame, expected);

  // 3-byte pixels: 9 bytes and 3 of padding per row; the walk covers the first 18 bytes.
  std::vector<uint8_t> packed(24, 100);
  bits = packed.data();
  CxImage rgb(&bits, 3, 2, 24, 12, IPF_BGR);
  brightnessAdjustment(&rgb, 100.0f);
  for (int i = 0; i < 24; ++i) EXPECT_EQ(packed[i], i < 18 ? 200 : 100) << i;

  // One-byte pixels still get three bytes each: the windows overlap, and stop at the buffer's
  // end instead of running past it.
  std::vector<uint8_t> grey(4, 10);
  bits = grey.data();
  CxImage narrow(&bits, 4, 1, 8, 4, IPF_Gray8);
  brightnessAdjustment(&narrow, 100.0f);
  EXPECT_EQ(grey, (std::vector<uint8_t>{20, 40, 80, 80}));
}

TEST(ColorAdjust, PerPixelFormsKeepTheirOwnLimits) {
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
