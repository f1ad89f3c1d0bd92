#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

#include "lut/ChromeKeyLut3dGenerator.h"
#include "support/EffectHarness.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

using tfx_test::CreateEffect;
using tfx_test::kChromeKey;
using tfx_test::SetParam;
using tfx_test::Settings;

// B, G, R, A: the screen, skin, a grey, a warm colour with green spill (half the screen's
// chroma), a grey as bright as the screen with a quarter of its chroma.
const std::vector<uint8_t> kPixels = {60,  200, 40,  255, 138, 170, 222, 200, 128, 128,
                                      128, 9,   120, 200, 150, 0,   165, 200, 160, 255};

// One frame through the filter; the five output pixels.
std::vector<uint8_t> RunFrame(INLECGFilter* filter, int dstStride = 0) {
  const std::vector<uint8_t> out =
      tfx_test::RunFrame(filter, new TestFrame(5, 1, kPixels), new TestFrame(5, 1, dstStride));
  return std::vector<uint8_t>(out.begin(), out.begin() + 20);
}

NLEComPtr<INLECGFilter> GreenKey(double mode) {
  return CreateEffect(kChromeKey, Settings(tfx_test::EffectParams{{L"red", 40},
                                                                  {L"green", 200},
                                                                  {L"blue", 60},
                                                                  {L"contrast", 50},
                                                                  {L"offset", 0},
                                                                  {L"mode", mode}}));
}

TEST(ChromeKeyLut3dEffect, ModeSelectsMaskOrBeauty) {
  const std::vector<uint8_t> mask = RunFrame(GreenKey(0).get());
  const int expectedMask[5] = {0, 255, 255, 128, 255};
  for (int p = 0; p < 5; ++p) {
    SCOPED_TRACE(p);
    const uint8_t* m = &mask[p * 4];
    EXPECT_TRUE(m[0] == m[1] && m[1] == m[2]);
    EXPECT_EQ(m[3], kPixels[p * 4 + 3]);
    EXPECT_NEAR(m[0], expectedMask[p], 3);
  }

  // Padded destination rows go through the pipeline's private copy.
  const std::vector<uint8_t> beauty = RunFrame(GreenKey(1).get(), 64);
  for (int p = 0; p < 5; ++p) EXPECT_EQ(beauty[p * 4 + 3], kPixels[p * 4 + 3]);
  for (int p : {1, 2}) {
    for (int c = 0; c < 3; ++c) EXPECT_NEAR(beauty[p * 4 + c], kPixels[p * 4 + c], 1);
  }
  const uint8_t* spill = &beauty[12];
  EXPECT_LE(spill[1], std::max(spill[0], spill[2]) + 1);
}

// The beauty LUT depends on the key colour alone: contrast and offset rebuild only the alpha LUT,
// and an unchanged setting rebuilds nothing.
TEST(ChromeKeyLut3dEffect, RebuildsOnlyTheTablesAChangeAffects) {
  NLEComPtr<INLECGFilter> filter = GreenKey(0);
  using Gen = NLEChromeKeyLut3dGenerator;
  uint64_t beauty = Gen::beautyLutsBuilt(), alpha = Gen::alphaLutsBuilt();
  auto built = [&](int expectBeauty, int expectAlpha) {
    EXPECT_EQ(Gen::beautyLutsBuilt() - beauty, static_cast<uint64_t>(expectBeauty));
    EXPECT_EQ(Gen::alphaLutsBuilt() - alpha, static_cast<uint64_t>(expectAlpha));
    beauty = Gen::beautyLutsBuilt();
    alpha = Gen::alphaLutsBuilt();
  };

  const std::vector<uint8_t> first = RunFrame(filter.get());
  built(1, 1);
  RunFrame(filter.get());
  built(0, 0);

  SetParam(filter.get(), L"contrast", 0);
  const std::vector<uint8_t> softer = RunFrame(filter.get());
  built(0, 1);
  EXPECT_LE(softer[0], 3);
  EXPECT_NEAR(softer[16], 191, 3);  // alpha = 1 - share of the screen

  SetParam(filter.get(), L"offset", 20);
  RunFrame(filter.get());
  built(0, 1);

  SetParam(filter.get(), L"green", 180);
  SetParam(filter.get(), L"mode", 1);
  const std::vector<uint8_t> beautyAfterKey = RunFrame(filter.get());
  built(1, 1);
  SetParam(filter.get(), L"green", 180);  // the same value again
  RunFrame(filter.get());
  built(0, 0);

  // The colours follow the new key: the contrast change did not leave a stale beauty LUT.
  NLEComPtr<INLECGFilter> fresh = GreenKey(1);
  SetParam(fresh.get(), L"green", 180);
  EXPECT_EQ(RunFrame(fresh.get()), beautyAfterKey);
}

}  // namespace
