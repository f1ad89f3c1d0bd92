#include "tessarofx/LightAdjust.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <string>
#include <vector>

#include "adjust/ColorAdjustReference.h"
#include "adjust/LightAdjustReference.h"
#include "adjust/LightAdjustTables.h"

namespace {

using tfx_test::Clone;
using tfx_test::EveryColour;
using tfx_test::Image;
using tfx_test::NoiseImage;
using tfx_test::SameBuffer;

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

const Operation kHighlight = {"Highlight", hdrHighlight, tfx_test::ReferenceHighlight, calHighlight,
                              1.0f,        1.0f,         {100, -100, 37, 300}};
const Operation kShadow = {"Shadow", hdrShadow, tfx_test::ReferenceShadow, calShadow,
                           2.0f,     0.5f,      {100, -100, -41.5f, 250}};
const Operation kWhiteLevel = {"WhiteLevel",        hdrWhiteLevel, tfx_test::ReferenceWhiteLevel,
                               calWhiteLevelPixel,  1.0f,          1.0f,
                               {100, -100, 63, 250}};
const Operation kBlackLevel = {"BlackLevel",         hdrBlackLevel, tfx_test::ReferenceBlackLevel,
                               calBlackLevelPixel,   0.5f,          2.0f,
                               {100, -100, 29, -180}};
const Operation* const kOperations[] = {&kHighlight, &kShadow, &kWhiteLevel, &kBlackLevel};

class LightAllColours : public testing::TestWithParam<const Operation*> {};

TEST_P(LightAllColours, MatchesReference) {
  for (const float strength : GetParam()->sweep) {
    SCOPED_TRACE(strength);
    const Image expected = Clone(EveryColour());
    GetParam()->reference(expected.get(), strength);
    const Image actual = Clone(EveryColour());
    EXPECT_EQ(GetParam()->exported(actual.get(), strength), actual.get());
    EXPECT_TRUE(SameBuffer(*expected, *actual));
  }
}

INSTANTIATE_TEST_SUITE_P(LightAdjust, LightAllColours, testing::ValuesIn(kOperations),
                         [](const testing::TestParamInfo<const Operation*>& p) {
                           return std::string(p.param->name);
                         });

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
    tfx_test::ReferenceHighlight(expected.get(), c.h);
    tfx_test::ReferenceShadow(expected.get(), c.s);
    tfx_test::ReferenceWhiteLevel(expected.get(), c.w);
    tfx_test::ReferenceBlackLevel(expected.get(), c.k0);
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
      for (const Operation* op : kOperations) {
        SCOPED_TRACE(op->name);
        const Image actual = Clone(*original), expected = Clone(*original);
        op->reference(expected.get(), 70);
        EXPECT_EQ(op->exported(actual.get(), 70), actual.get());
        EXPECT_TRUE(SameBuffer(*expected, *actual));
      }
      const Image actual = Clone(*original), expected = Clone(*original);
      tfx_test::ReferenceHighlight(expected.get(), 70);
      tfx_test::ReferenceShadow(expected.get(), -40);
      tfx_test::ReferenceWhiteLevel(expected.get(), 30);
      tfx_test::ReferenceBlackLevel(expected.get(), -55);
      tfx::LightAdjust(actual.get(), 70, -40, 30, -55);
      EXPECT_TRUE(SameBuffer(*expected, *actual));
    }
  }
}

TEST(LightAdjust, ImageFunctionsScaleStrengthAsThePerPixelFormsExpect) {
  // Shadow lifts four times as strongly as it deepens, black level the other way round. Absurd
  // strengths overflow the curve; the tables must still give the per-pixel bytes.
  constexpr float kInf = std::numeric_limits<float>::infinity();
  const float strengths[] = {100, -100, 55, 1e30f, -kInf, std::numeric_limits<float>::quiet_NaN()};
  const Image noise = NoiseImage(61, 17, 32, IPF_BGRA, 61 * 4, 21);
  for (const Operation* op : kOperations) {
    for (const float strength : strengths) {
      SCOPED_TRACE(testing::Message() << op->name << ' ' << strength);
      const Image actual = Clone(*noise);
      op->exported(actual.get(), strength);
      const float arg = strength / 100.0f * (strength > 0 ? op->up : op->down);
      const Image expected = Clone(*noise);
      for (unsigned long y = 0; y < 17; ++y) {
        for (unsigned long x = 0; x < 61; ++x) {
          expected->SetPixelColor(x, y, op->perPixel(expected->GetPixelColor(x, y), arg));
        }
      }
      EXPECT_TRUE(SameBuffer(*expected, *actual));
    }
  }
}

// E(100, 5) = 403.9: the byte form keeps the low 8 bits (403 & 255) rather than clamping.
TEST(LightAdjust, TheByteFormWraps) { EXPECT_EQ(enHanceColor(100, 5), 147); }

}  // namespace
