// What a host can do to the lattice class through its public calls without harming a filter or
// the library: the process-wide instance, and pixel arguments doLUT cannot use.
#include <gtest/gtest.h>

#include <climits>
#include <cstdint>
#include <memory>
#include <vector>

#include "support/EffectHarness.h"
#include "tessarofx/CubeLut.h"

namespace {

using tfx_test::kChromeKey;
using tfx_test::kLut;

TEST(CubeLutInstance, NeverHandsOutOrDestroysAFiltersTable) {
  CubeLut::releaseInstance();
  CubeLut* hosts = new CubeLut();  // the host's own, now the instance
  NLEComPtr<INLECGFilter> keyer = tfx_test::CreateEffect(
      kChromeKey, tfx_test::Settings({{L"green", 200}, {L"contrast", 50}, {L"mode", 0}}));
  NLEComPtr<INLECGFilter> lut =
      tfx_test::CreateEffect(kLut, tfx_test::TextSettings(L"lut3dPath", L"/nonexistent.cube"));
  TestFrame* fg = new TestFrame(7, 3, 0, false, 90);
  TestFrame* dst = new TestFrame(7, 3);
  NLEComPtr<INLEFrame> holdFg(fg), holdDst(dst);
  // The keyer's mask, then the LUT filter, whose unreadable file passes frames through.
  const auto run = [&](std::vector<uint8_t>* mask) {
    keyer->SetForeground(fg);
    ASSERT_EQ(keyer->Running(dst), NLE_S_OK);
    *mask = dst->pixels;
    lut->SetForeground(fg);
    ASSERT_EQ(lut->Running(dst), NLE_S_OK);
    EXPECT_EQ(dst->pixels, fg->pixels);
  };
  std::vector<uint8_t> first, second;
  run(&first);
  EXPECT_EQ(CubeLut::getInstance(), hosts);

  // Releasing whatever is registered, twice, leaves both filters working: under the sanitizers a
  // filter whose table had been released would read freed memory here.
  CubeLut::releaseInstance();
  CubeLut::releaseInstance();
  run(&second);
  EXPECT_EQ(first, second);
}

TEST(CubeLutApply, LeavesPixelsAloneWhenItsArgumentsCannotDescribeThem) {
  std::unique_ptr<CubeLut> lut(new CubeLut());
  lut->generateLUT3DData(2);  // maps 255 to 8: every applied pixel would change
  struct Case {
    const char* name;
    bool null;
    int width, height, pitch, bytesPerPixel;
  };
  const Case cases[] = {
      {"null pixels", true, 4, 2, 16, 4},
      {"pitch below a row", false, 4, 2, 15, 4},
      {"negative short pitch", false, 4, 2, -8, 4},
      {"zero width", false, 0, 2, 16, 4},
      {"two bytes a pixel", false, 4, 2, 16, 2},
      {"negative width", false, -4, 2, 16, 4},
      {"rows past INT_MAX bytes", false, 4, 3, INT_MAX / 2 + 1, 4},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    // Exactly the bytes a sound call would need, so that any overreach is out of bounds.
    std::vector<uint8_t> pixels(32, 255);
    uint8_t* start = c.pitch < 0 ? pixels.data() + 16 : pixels.data();
    EXPECT_EQ(lut->doLUT(c.null ? nullptr : start, c.width, c.height, c.pitch, c.bytesPerPixel), 0);
    EXPECT_EQ(pixels, std::vector<uint8_t>(32, 255));
  }
  std::vector<uint8_t> row(12, 255);
  EXPECT_EQ(lut->doLUT(row.data(), 3, 1, 0, 4), 0);  // one row needs no pitch
  EXPECT_EQ(row[0], 8);
}

}  // namespace
