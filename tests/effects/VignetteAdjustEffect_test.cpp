#include <gtest/gtest.h>

#include "support/EffectHarness.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"
#include "tessarofx/Vignette.h"

namespace {

TEST(VignetteAdjustEffect, PassesEachParameterToItsArgumentWithItsDefault) {
  // Distinct values show the argument order; the short lists show the values of missing
  // parameters (size 100, feather 50, highlights 50, roundness and exposure 0).
  const struct {
    tfx_test::EffectParams params;
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
    NLEComPtr<INLECGFilter> filter = tfx_test::CreateEffect(L"8622FC58-4DF1-44BD-9B37-2F633D4D3368",
                                                            tfx_test::Settings(c.params));
    tfx_test::ExpectMatchesImageForm(filter.get(), 61, 35, 260, [&](CxImage* image) {
      vignetteAdjustFilter(image, c.amount, c.feather, c.highlights, c.size, c.roundness,
                           c.exposure);
    });
  }
}

}  // namespace
