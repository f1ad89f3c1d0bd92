#include "tessarofx/LightAdjust.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <limits>
#include <string>
#include <vector>

#include "adjust/LightAdjustTables.h"
#include "support/ImageBuilders.h"

namespace {

using tfx_test::Clone;
using tfx_test::EveryColour;
using tfx_test::Image;
using tfx_test::MapPixels;
using tfx_test::NoiseImage;
using tfx_test::SameBuffer;
using tfx_test::SameResult;

// Per-pixel references written from the formulas alone, sharing no code with the library.
float Enhance(float ch, float k) { return 255.0f - (255.0f - ch) * (255.0f - k * ch) / 255.0f; }

// fn(channel, M) gives the new channel.
template <class Fn>
void EveryPixel(CxImage* image, Fn fn) {
  tfx_test::MapPixels(image, [&](tagRGBQUAD c) {
    const float m = std::max({c.rgbRed, c.rgbGreen, c.rgbBlue}) / 255.0f;
    c.rgbBlue = fn(c.rgbBlue, m);
    c.rgbGreen = fn(c.rgbGreen, m);
    c.rgbRed = fn(c.rgbRed, m);
    return c;
  });
}

uint8_t Wrapped(float v) { return static_cast<uint8_t>(static_cast<int>(v)); }

uint8_t Clamped(float v) { return static_cast<uint8_t>(std::clamp(static_cast<int>(v), 0, 255)); }

void RefHighlight(CxImage* image, float h) {
  if (h == 0) return;
  EveryPixel(image, [&](uint8_t ch, float m) { return Wrapped(Enhance(ch, m * (h / 100.0f))); });
}

void RefShadow(CxImage* image, float s) {
  if (s == 0) return;
  const float f = static_cast<float>(s / 100.0f * (s > 0 ? 2.0 : 0.5));
  EveryPixel(image, [&](uint8_t ch, float m) { return Wrapped(Enhance(ch, (1 - m) * f)); });
}

void RefWhiteLevel(CxImage* image, float w) {
  if (w == 0) return;
  EveryPixel(image, [&](uint8_t ch, float m) {
    const float k = m * (w / 100.0f);
    float t = Enhance(ch, k);
    if (k > 0) t = Enhance(t, k);
    return Clamped(t);
  });
}

void RefBlackLevel(CxImage* image, float k0) {
  if (k0 == 0) return;
  const float f = static_cast<float>(k0 / 100.0f * (k0 > 0 ? 0.5 : 2.0));
  EveryPixel(image, [&](uint8_t ch, float m) { return Clamped(Enhance(ch, (1 - m) * f)); });
}

struct Operation {
  const char* name;
  CxImage* (*exported)(CxImage*, float);
  void (*reference)(CxImage*, float);
  tagRGBQUAD (*perPixel)(tagRGBQUAD, float);
  float up, down;  // the per-pixel argument is strength / 100 times `up` (strength > 0) or `down`
  // Both signs and the usual extremes; beyond them highlight 300 and shadow 250 leave 0..255 and
  // wrap, white level 250 and black level -180 clamp.
  std::vector<float> sweep;
};

const Operation kOperations[] = {
    {"Highlight", hdrHighlight, RefHighlight, calHighlight, 1, 1, {100, -100, 37, 300}},
    {"Shadow", hdrShadow, RefShadow, calShadow, 2, 0.5, {100, -100, -41.5f, 250}},
    {"WhiteLevel", hdrWhiteLevel, RefWhiteLevel, calWhiteLevelPixel, 1, 1, {100, -100, 63, 250}},
    {"BlackLevel", hdrBlackLevel, RefBlackLevel, calBlackLevelPixel, 0.5, 2, {100, -100, 29, -180}},
};

class LightAllColours : public testing::TestWithParam<Operation> {};

TEST_P(LightAllColours, MatchesReference) {
  for (const float strength : GetParam().sweep) {
    SCOPED_TRACE(strength);
    const Image expected = Clone(EveryColour());
    GetParam().reference(expected.get(), strength);
    const Image actual = Clone(EveryColour());
    EXPECT_EQ(GetParam().exported(actual.get(), strength), actual.get());
    EXPECT_TRUE(SameBuffer(*expected, *actual));
  }
}

INSTANTIATE_TEST_SUITE_P(LightAdjust, LightAllColours, testing::ValuesIn(kOperations),
                         [](const testing::TestParamInfo<Operation>& p) { return p.param.name; });

TEST(LightAdjust, OnePassEqualsTheFourOperationsInTurn) {
  // The folded table must not tell from four passes, and settings whose operations let a darker
  // channel overtake the brightest one must take the four passes.
  const struct {
    float h, s, w, k0;
    bool folds;
  } cases[] = {{100, 100, 100, 100, true},
               {-100, -100, -100, -100, true},
               {45, -20, 0, 70, true},
               {300, 0, 40, -60, false}};
  std::vector<uint8_t> table(tfx::kLightTableSize);
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << c.h << ' ' << c.s << ' ' << c.w << ' ' << c.k0);
    EXPECT_EQ(tfx::FoldLightAdjust(c.h, c.s, c.w, c.k0, table.data()), c.folds);
    const Image expected = Clone(EveryColour());
    RefHighlight(expected.get(), c.h);
    RefShadow(expected.get(), c.s);
    RefWhiteLevel(expected.get(), c.w);
    RefBlackLevel(expected.get(), c.k0);
    const Image actual = Clone(EveryColour());
    EXPECT_EQ(tfx::LightAdjust(actual.get(), c.h, c.s, c.w, c.k0), actual.get());
    EXPECT_TRUE(SameBuffer(*expected, *actual));
  }
}

TEST(LightAdjust, MatchesReferenceOnPaddedRowsAndOtherLayouts) {
  // One at a time, then all four at once: 16-bit pixels lose bits on every write, which one
  // pass would skip.
  for (const tfx_test::Layout& layout : tfx_test::kLayouts) {
    for (const unsigned width : {1u, 7u, 13u}) {
      SCOPED_TRACE(testing::Message()
                   << layout.bpp << " bpp " << layout.format << " width " << width);
      const Image original = NoiseImage(layout, width, 5, 12, width);
      for (const Operation& op : kOperations) {
        EXPECT_TRUE(SameResult(
            *original, [&](CxImage* i) { EXPECT_EQ(op.exported(i, 70), i); },
            [&](CxImage* i) { op.reference(i, 70); }))
            << op.name;
      }
      EXPECT_TRUE(SameResult(
          *original, [](CxImage* i) { tfx::LightAdjust(i, 70, -40, 30, -55); },
          [](CxImage* i) {
            RefHighlight(i, 70);
            RefShadow(i, -40);
            RefWhiteLevel(i, 30);
            RefBlackLevel(i, -55);
          }));
    }
  }
}

TEST(LightAdjust, ImageFunctionsScaleStrengthAsThePerPixelFormsExpect) {
  // Shadow lifts four times as strongly as it deepens, black level the other way round. Absurd
  // strengths overflow the curve; the tables must still give the per-pixel bytes.
  constexpr float kInf = std::numeric_limits<float>::infinity();
  const float strengths[] = {100, -100, 55, 1e30f, -kInf, std::numeric_limits<float>::quiet_NaN()};
  const Image noise = NoiseImage(61, 17, 32, IPF_BGRA, 61 * 4, 21);
  for (const Operation& op : kOperations) {
    for (const float strength : strengths) {
      SCOPED_TRACE(testing::Message() << op.name << ' ' << strength);
      const float arg = strength / 100.0f * (strength > 0 ? op.up : op.down);
      EXPECT_TRUE(SameResult(
          *noise, [&](CxImage* i) { op.exported(i, strength); },
          [&](CxImage* i) { MapPixels(i, [&](tagRGBQUAD c) { return op.perPixel(c, arg); }); }));
    }
  }
  // E(100, 5) = 403.9: the byte form keeps the low 8 bits (403 & 255) rather than clamping.
  EXPECT_EQ(enHanceColor(100, 5), 147);
}

}  // namespace
