#include <gtest/gtest.h>

#include <vector>

#include "support/EffectHarness.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"
#include "tessarofx/Vignette.h"

namespace {

using Params = tfx_test::EffectParams;

NLEComPtr<INLECGFilter> CreateVignette(const Params& values) {
  return tfx_test::CreateEffect(L"8622FC58-4DF1-44BD-9B37-2F633D4D3368",
                                tfx_test::Settings(values));
}

TEST(VignetteAdjustEffect, PassesEachParameterToItsArgumentWithItsDefault) {
  // Distinct values show the argument order; the short lists show the values of missing
  // parameters (size 100, feather 50, highlights 50, roundness and exposure 0).
  const struct {
    Params params;
    float amount, feather, highlights, size, roundness, exposure;
  } cases[] = {
      {{{L"amount", -40},
        {L"size", 30},
        {L"roundness", 60},
        {L"feather", 80},
        {L"exposure", 25},
        {L"highlights", 70}},
       -40,
       80,
       70,
       30,
       60,
       25},
      {{{L"amount", -70}}, -70, 50, 50, 100, 0, 0},
      {{{L"exposure", -60}, {L"roundness", 20}}, 0, 50, 50, 100, 20, -60},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << "amount " << c.amount << " exposure " << c.exposure);
    NLEComPtr<INLECGFilter> filter = CreateVignette(c.params);
    TestFrame* fg = new TestFrame(61, 35);
    TestFrame* dst = new TestFrame(61, 35, 260);  // padded rows go through a private copy
    NLEComPtr<INLEFrame> h1(fg), h2(dst);
    tfx_test::FillRandom(fg, 61);
    filter->SetForeground(fg);
    ASSERT_EQ(filter->Running(dst), NLE_S_OK);

    std::vector<uint8_t> expected = fg->pixels;
    uint8_t* bits = expected.data();
    CxImage image(&bits, 61, 35, 32, 61 * 4, IPF_BGRA);
    vignetteAdjustFilter(&image, c.amount, c.feather, c.highlights, c.size, c.roundness,
                         c.exposure);
    for (int y = 0; y < 35; ++y) {
      ASSERT_TRUE(std::equal(dst->Row(y), dst->Row(y) + 61 * 4, bits + y * 61 * 4)) << y;
    }
  }
}

}  // namespace
