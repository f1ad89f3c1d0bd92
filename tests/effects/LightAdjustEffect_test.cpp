#include <gtest/gtest.h>

#include "support/EffectHarness.h"
#include "tessarofx/LightAdjust.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

TEST(LightAdjustEffect, AppliesTheFourOperationsInOrder) {
  // Highlight, shadow, white level, black level, each seeing the previous one's output.
  NLEComPtr<INLECGFilter> filter = tfx_test::CreateEffect(
      L"D8651B53-F47A-4B98-B8E9-35B491D5EADC",
      tfx_test::Settings(
          {{L"u_blackLevel", -35}, {L"u_highLight", 60}, {L"u_shadow", 80}, {L"u_whiteLevel", 0}}));
  tfx_test::SetParam(filter.get(), L"u_whiteLevel", -45);
  tfx_test::ExpectMatchesImageForm(filter.get(), 64, 4, 300, [](CxImage* image) {
    hdrBlackLevel(hdrWhiteLevel(hdrShadow(hdrHighlight(image, 60), 80), -45), -35);
  });
}

}  // namespace
