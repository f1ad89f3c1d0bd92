#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

#include "support/EffectHarness.h"
#include "tessarofx/LensAdjust.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

NLEComPtr<INLECGFilter> CreateLens(double distortion, double fringing) {
  return tfx_test::CreateEffect(
      L"CFAAD60B-AC2B-4B39-A8E1-D25E35A6F735",
      tfx_test::Settings({{L"distortion", distortion}, {L"fringing", fringing}}));
}

TEST(DistortionFringingAdjustEffect, DistortsThenFringesTheForeground) {
  // Frames of one size are resampled straight from the foreground, a taller foreground is cut
  // to the output first. A distortion of -2000 sends
  // samples out of the frame, where the foreground's own pixel stays. The padded destination
  // goes through a private packed copy.
  const struct {
    double distortion, fringing;
    int fgHeight;
  } cases[] = {{-35, 60, 30}, {0, 45, 30}, {70, 0, 30}, {25, -40, 34}, {-2000, 30, 30}};
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << c.distortion << ' ' << c.fringing << ' ' << c.fgHeight);
    NLEComPtr<INLECGFilter> filter = CreateLens(c.distortion, c.fringing);
    TestFrame* fg = new TestFrame(50, c.fgHeight);
    TestFrame* dst = new TestFrame(50, 30, 216);
    NLEComPtr<INLEFrame> h1(fg), h2(dst);
    tfx_test::FillRandom(fg, 5);
    filter->SetForeground(fg);
    ASSERT_EQ(filter->Running(dst), NLE_S_OK);

    std::vector<uint8_t> expected = fg->pixels;
    uint8_t* bits = expected.data();
    CxImage image(&bits, 50, 30, 32, 200, IPF_BGRA);
    fringingFilter(distortFilter(&image, float(c.distortion)), float(c.fringing));
    for (int y = 0; y < 30; ++y) {
      ASSERT_TRUE(std::equal(dst->Row(y), dst->Row(y) + 200, bits + y * 200)) << y;
    }
  }
}

}  // namespace
