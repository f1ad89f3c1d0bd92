#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "support/EffectHarness.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

using tfx_test::CreateEffect;
using tfx_test::FillRandom;
using tfx_test::Settings;
constexpr const wchar_t* kColorAdjust = L"18C6E879-4138-42D0-B0B9-6B4401AA97E6";

TEST(ColorAdjustEffect, BrightnessDoublesChannelsAndKeepsAlpha) {
  NLEComPtr<INLECGFilter> filter = CreateEffect(kColorAdjust, Settings({{L"u_brightness", 100}}));
  TestFrame* fg = new TestFrame(64, 4);
  TestFrame* bg = new TestFrame(64, 4, 0, false, 0x55);
  TestFrame* dst = new TestFrame(64, 4, 300);  // padded rows go through a private copy
  NLEComPtr<INLEFrame> h1(fg), h2(bg), h3(dst);
  FillRandom(fg, 2);
  filter->SetForeground(fg);
  filter->SetBackground(bg);  // never read by this effect
  ASSERT_EQ(filter->Running(dst), NLE_S_OK);
  for (int y = 0; y < 4; ++y) {
    for (int x = 0; x < 64; ++x) {
      const uint8_t* in = fg->Pixel(x, y);
      const uint8_t* out = dst->Pixel(x, y);
      for (int c = 0; c < 3; ++c) EXPECT_EQ(out[c], std::min(255, in[c] * 2));
      EXPECT_EQ(out[3], in[3]);
    }
  }
}

TEST(ColorAdjustEffect, ParametersChangedAfterCreationTakeEffect) {
  NLEComPtr<INLECGFilter> filter = CreateEffect(kColorAdjust, Settings({{L"u_exposure", 0}}));
  tfx_test::SetParam(filter.get(), L"u_exposure", 50);

  TestFrame* fg = new TestFrame(1, 1);
  TestFrame* dst = new TestFrame(1, 1);
  NLEComPtr<INLEFrame> h1(fg), h2(dst);
  fg->pixels = {100, 50, 200, 7};
  filter->SetForeground(fg);
  ASSERT_EQ(filter->Running(dst), NLE_S_OK);
  const float gain = static_cast<float>(std::pow(2.0, 50.0 / 50 * 0.6));
  EXPECT_EQ(dst->pixels[0], static_cast<int>(100 * gain));
  EXPECT_EQ(dst->pixels[1], static_cast<int>(50 * gain));
  EXPECT_EQ(dst->pixels[2], 255);
  EXPECT_EQ(dst->pixels[3], 7);
}

}  // namespace
