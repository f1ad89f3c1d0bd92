#include <gtest/gtest.h>

#include <vector>

#include "support/EffectHarness.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

using tfx_test::CreateEffect;
constexpr const wchar_t* kCombine = L"41AA934B-757A-4EAD-8F7B-85E2E2952B6A";

TEST(ChromeKeyCombineEffect, PremultipliesColourAndTakesAlphaFromTheMask) {
  NLEComPtr<INLECGFilter> filter = CreateEffect(kCombine, nullptr);
  TestFrame* mask = new TestFrame(4, 1);
  TestFrame* colour = new TestFrame(4, 1);
  TestFrame* dst = new TestFrame(4, 1, 0, false, 0xEE);
  NLEComPtr<INLEFrame> h1(mask), h2(colour), h3(dst);
  // Only byte 0 of the mask counts.
  mask->pixels = {77, 1, 2, 3, 200, 9, 9, 9, 200, 9, 9, 9, 0, 255, 255, 255};
  colour->pixels = {200, 100, 50, 128, 200, 100, 50, 9, 200, 100, 50, 10, 255, 255, 255, 255};
  filter->SetBackground(mask);
  filter->SetForeground(colour);
  ASSERT_EQ(filter->Running(dst), NLE_S_OK);
  const std::vector<uint8_t> expected = {100, 50, 25, 77,  7,   3,   1,   0,  // alpha 9: dropped
                                         7,   3,  1,  200, 255, 255, 255, 0};
  EXPECT_EQ(dst->pixels, expected);
}

// Pixels are matched by their index in each packed image; a smaller input limits the output to
// the pixels it holds.
TEST(ChromeKeyCombineEffect, WritesOnlyWhatEveryImageHolds) {
  NLEComPtr<INLECGFilter> filter = CreateEffect(kCombine, nullptr);
  TestFrame* mask = new TestFrame(3, 1, 0, false, 99);
  TestFrame* colour = new TestFrame(1, 2, 0, false, 255);
  TestFrame* dst = new TestFrame(3, 1, 0, false, 0xEE);
  NLEComPtr<INLEFrame> h1(mask), h2(colour), h3(dst);
  filter->SetBackground(mask);
  filter->SetForeground(colour);
  ASSERT_EQ(filter->Running(dst), NLE_S_OK);
  const std::vector<uint8_t> expected = {255, 255, 255,  99,   255,  255,
                                         255, 99,  0xEE, 0xEE, 0xEE, 0xEE};
  EXPECT_EQ(dst->pixels, expected);
}

TEST(ChromeKeyCombineEffect, NeedsBothMaskAndColour) {
  for (bool withMask : {false, true}) {
    NLEComPtr<INLECGFilter> filter = CreateEffect(kCombine, nullptr);
    TestFrame* frame = new TestFrame(2, 2, 0, false, 5);
    TestFrame* dst = new TestFrame(2, 2, 0, false, 9);
    NLEComPtr<INLEFrame> h1(frame), h2(dst);
    if (withMask) {
      filter->SetBackground(frame);
    } else {
      filter->SetForeground(frame);
    }
    EXPECT_EQ(filter->Running(dst), NLE_E_INVALIDARG);
    EXPECT_EQ(dst->pixels, std::vector<uint8_t>(16, 9));
  }
}

}  // namespace
