#include <gtest/gtest.h>

#include "support/EffectHarness.h"
#include "tessarofx/LensAdjust.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

TEST(DistortionFringingAdjustEffect, DistortsThenFringesTheForeground) {
  // Frames of one size are resampled straight from the foreground, a taller foreground is cut
  // to the output first. A distortion of -2000 sends samples out of the frame, where the
  // foreground's own pixel stays.
  const struct {
    double distortion, fringing;
    int fgHeight;
  } cases[] = {{-35, 60, 30}, {0, 45, 30}, {70, 0, 30}, {25, -40, 34}, {-2000, 30, 30}};
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << c.distortion << ' ' << c.fringing << ' ' << c.fgHeight);
    NLEComPtr<INLECGFilter> filter = tfx_test::CreateEffect(
        L"CFAAD60B-AC2B-4B39-A8E1-D25E35A6F735",
        tfx_test::Settings({{L"distortion", c.distortion}, {L"fringing", c.fringing}}));
    // Padded output rows, then packed ones twice: a setting held for a second frame takes the
    // single pass.
    for (const int stride : {216, 0, 0}) {
      tfx_test::ExpectMatchesImageForm(
          filter.get(), 50, 30, stride,
          [&](CxImage* image) {
            fringingFilter(distortFilter(image, float(c.distortion)), float(c.fringing));
          },
          c.fgHeight);
    }
  }
}

}  // namespace
