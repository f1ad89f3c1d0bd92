#include <gtest/gtest.h>

#include <vector>

#include "support/EffectHarness.h"
#include "tessarofx/LightAdjust.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

using tfx_test::CreateEffect;
using tfx_test::FillRandom;
using tfx_test::Settings;
constexpr const wchar_t* kLightAdjust = L"D8651B53-F47A-4B98-B8E9-35B491D5EADC";

TEST(LightAdjustEffect, AppliesTheFourOperationsInOrder) {
  // Highlight, shadow, white level, black level, each seeing the previous one's output; the
  // padded output goes through a private copy, the background is never read.
  NLEComPtr<INLECGFilter> filter = CreateEffect(
      kLightAdjust,
      Settings(
          {{L"u_blackLevel", -35}, {L"u_highLight", 60}, {L"u_shadow", 80}, {L"u_whiteLevel", 0}}));
  tfx_test::SetParam(filter.get(), L"u_whiteLevel", -45);

  TestFrame* fg = new TestFrame(64, 4);
  TestFrame* bg = new TestFrame(64, 4, 0, false, 0x55);
  TestFrame* dst = new TestFrame(64, 4, 300);
  NLEComPtr<INLEFrame> h1(fg), h2(bg), h3(dst);
  FillRandom(fg, 2);
  filter->SetForeground(fg);
  filter->SetBackground(bg);
  ASSERT_EQ(filter->Running(dst), NLE_S_OK);

  std::vector<uint8_t> expected = fg->pixels;
  uint8_t* bits = expected.data();
  CxImage image(&bits, 64, 4, 32, 256, IPF_BGRA);
  hdrBlackLevel(hdrWhiteLevel(hdrShadow(hdrHighlight(&image, 60), 80), -45), -35);
  for (int y = 0; y < 4; ++y) {
    for (int x = 0; x < 64; ++x) {
      for (int c = 0; c < 4; ++c) ASSERT_EQ(dst->Pixel(x, y)[c], expected[y * 256 + x * 4 + c]);
    }
  }
}

}  // namespace
