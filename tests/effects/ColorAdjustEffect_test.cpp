#include <gtest/gtest.h>

#include "support/EffectHarness.h"
#include "tessarofx/ColorAdjust.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

TEST(ColorAdjustEffect, PassesItsParametersAtCreationAndLater) {
  NLEComPtr<INLECGFilter> filter =
      tfx_test::CreateEffect(L"18C6E879-4138-42D0-B0B9-6B4401AA97E6",
                             tfx_test::Settings({{L"u_brightness", 100}, {L"u_exposure", 0}}));
  // Padded rows go through a private copy.
  tfx_test::ExpectMatchesImageForm(filter.get(), 64, 4, 300,
                                   [](CxImage* image) { brightnessAdjustment(image, 100); });
  tfx_test::SetParam(filter.get(), L"u_brightness", 0);
  tfx_test::SetParam(filter.get(), L"u_exposure", 50);
  tfx_test::ExpectMatchesImageForm(filter.get(), 5, 3, 0,
                                   [](CxImage* image) { exposureAdjustment(image, 50); });
}

}  // namespace
