// Headers and arguments a host may build from its own numbers: none of them may lead the image
// class or the adjustment functions past the memory a header describes.
#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstdint>
#include <functional>
#include <limits>
#include <memory>
#include <vector>

#include "adjust/LightAdjustTables.h"
#include "support/ImageBuilders.h"
#include "tessarofx/ColorAdjust.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/Denoise.h"
#include "tessarofx/DetailFilters.h"
#include "tessarofx/HSLAdjust.h"
#include "tessarofx/HueAdjust.h"
#include "tessarofx/LensAdjust.h"
#include "tessarofx/LightAdjust.h"
#include "tessarofx/Vignette.h"
#include "tessarofx/WhiteBalance.h"

namespace {

using tfx_test::Image;
using tfx_test::NoiseBytes;

TEST(CxImageWrapping, NeverGrowsPastTheCallersBuffer) {
  // The header claims 16 bytes of a larger buffer; what lies beyond is not the image's.
  std::vector<uint8_t> buffer = NoiseBytes(64, 1);
  const std::vector<uint8_t> original = buffer;
  uint8_t* bits = buffer.data();
  CxImage image(&bits, 2, 2, 32, 8, IPF_BGRA);
  EXPECT_EQ(image.Create(4, 4, 32, IPF_BGRA), nullptr);
  EXPECT_EQ(image.GetWidth(), 0u);

  CxImage again(&bits, 2, 2, 32, 8, IPF_BGRA);
  CxImage r(4, 4, 8, IPF_Gray8), g(4, 4, 8, IPF_Gray8), b(4, 4, 8, IPF_Gray8);
  EXPECT_FALSE(again.Combine(&r, &g, &b, nullptr, 0));
  EXPECT_EQ(buffer, original);
  // Shrinking stays within the buffer.
  CxImage shrink(&bits, 2, 2, 32, 8, IPF_BGRA);
  EXPECT_EQ(shrink.Create(1, 2, 32, IPF_BGRA), &shrink);

  // A stride shorter than a row is no image to split.
  CxImage shortRows(&bits, 8, 2, 32, 16, IPF_BGRA);
  EXPECT_FALSE(shortRows.SplitRGBA(&r, &g, &b, nullptr));
  EXPECT_FALSE(shortRows.SplitHSLA(&r, &g, &b, nullptr));
  EXPECT_EQ(r.GetWidth(), 4u);
  // Rows of no pixels split at once into empty planes, however many rows the header claims.
  CxImage noColumns(&bits, 0, UINT32_MAX, 32, 0, IPF_BGRA);
  EXPECT_TRUE(noColumns.SplitRGBA(&r, &g, &b, nullptr));
  EXPECT_TRUE(noColumns.SplitHSLA(&r, &g, &b, nullptr));
  EXPECT_EQ(r.GetWidth(), 0u);
}

// Every image function at a strength that changes pixels and at settings that change nothing;
// fourBytes marks those that refuse 8- and 16-bit pixels too.
struct Function {
  const char* name;
  std::function<CxImage*(CxImage*, float)> run;
  float strength;
  std::vector<float> idle;
  bool fourBytes = false;
};

std::vector<Function> Functions() {
  const float nan = std::nanf(""), inf = std::numeric_limits<float>::infinity();
  const std::vector<float> zero = {0}, any = {0, -0.0f, nan, inf, -inf};
  return {
      {"exposure", exposureAdjustment, 50, zero},
      {"brightness", brightnessAdjustment, 50, zero},
      {"contrast", contrastAdjustment, 50, zero},
      {"vibrance", vibranceAdjustment, 50, zero},
      {"saturation", saturationAdjustment, 50, zero},
      {"highlight", hdrHighlight, 50, zero},
      {"shadow", hdrShadow, 50, zero},
      {"white level", hdrWhiteLevel, 50, zero},
      {"black level", hdrBlackLevel, 50, zero},
      {"light", [](CxImage* i, float s) { return tfx::LightAdjust(i, s, s, s, s); }, 10, zero},
      // Negative v puts the threshold on the top sum, above which nothing lies.
      {"balance", whiteBalanceAdjustment, 50, {0, -20}},
      {"temperature",
       [](CxImage* i, float t) { return temperatureAdjustment(i, long(t)); },
       5000,
       {11500}},
      {"tint", tintAdjustment, 50, zero},
      // Without amount and exposure the shape settings change nothing.
      {"vignette",
       [](CxImage* i, float s) { return vignetteAdjustFilter(i, s, 80, 90, 10, 50, s); }, -50,
       zero},
      {"hue", hueAdjustment, 90, {0, nan, inf}},
      {"distortion", distortFilter, 30, zero},
      {"fringing", fringingFilter, 30, zero},
      // Zero hue, sat and light: a no-op whatever the shapes.
      {"hsl",
       [](CxImage* i, float s) {
         HSLBands bands{};
         for (HSLBandValues& v : bands.band) v = {s, 0, 0, 70, -90};
         return hslAdjustment(i, bands);
       },
       50, zero},
      {"dehaze", dehaze, 60, any, true},
      {"sharpen", sharpen, 60, any, true},
      // Clarity blurs only for 2 < |amount| < 254; without a blur the values stay.
      {"clarity", clarity, 60, {0, -0.0f, nan, inf, -inf, 1, -1, 2, -2, 254, 300}, true},
      {"diffuse", diffuse, 60, any, true},
      {"grain", [](CxImage* i, float a) { return addNoiseFilter(i, a, 80.0f); }, 60, any, true},
      {"grain factor", [](CxImage* i, float f) { return addNoiseFilter(i, 50.0f, f); }, 80, zero,
       true},
      {"denoise", deNoiseRGB, 50, zero, true},
      {"denoise, lightness", deNoiseLumiance, 50, zero, true},
  };
}

TEST(ImageFunctions, LeaveImagesAloneAtIdleSettings) {
  const Image original = tfx_test::NoiseImage(9, 4, 32, IPF_BGRA, 40, 3);
  for (const Function& f : Functions()) {
    for (const float idle : f.idle) {
      SCOPED_TRACE(testing::Message() << f.name << " " << idle);
      const Image image = tfx_test::Clone(*original);
      EXPECT_EQ(f.run(image.get(), idle), image.get());
      EXPECT_TRUE(tfx_test::SameBuffer(*original, *image));
    }
  }
}

TEST(ImageFunctions, LeaveMissingPixelsAndInconsistentHeadersUntouched) {
  const struct {
    const char* name;
    unsigned width, height, bpp, effWidth;
    _ImagePixelFormat format;
    bool fourBytesOnly = false;
  } headers[] = {
      {"32-bit rows longer than the stride", 8, 4, 32, 16, IPF_BGRA},
      {"24-bit rows longer than the stride", 8, 4, 24, 16, IPF_BGR},
      {"size wrapped to 128 bytes", 16, (1u << 26) + 2, 32, 64, IPF_BGRA},
      {"size wrapped to 0", 16384, 65536, 32, 65536, IPF_BGRA},
      {"5-byte pixels", 4, 4, 40, 20, IPF_BGRA},
      {"no columns", 0, 4, 32, 16, IPF_BGRA},
      {"grey", 8, 8, 8, 8, IPF_Gray8, true},
      {"16-bit pixels", 4, 8, 16, 8, IPF_BGR, true},
  };
  CxImage empty;
  uint8_t* none = nullptr;
  CxImage headerOnly(&none, 8, 8, 32, 32, IPF_BGRA);
  for (const Function& f : Functions()) {
    SCOPED_TRACE(f.name);
    EXPECT_EQ(f.run(nullptr, f.strength), nullptr);
    EXPECT_EQ(f.run(&empty, f.strength), &empty);
    EXPECT_EQ(f.run(&headerOnly, f.strength), &headerOnly);
    for (const auto& h : headers) {
      if (h.fourBytesOnly && !f.fourBytes) continue;
      SCOPED_TRACE(h.name);
      std::vector<uint8_t> buffer = NoiseBytes(512, 2);
      const std::vector<uint8_t> original = buffer;
      uint8_t* bits = buffer.data();
      CxImage image(&bits, h.width, h.height, h.bpp, h.effWidth, h.format);
      for (const float strength : {f.strength, -f.strength}) {  // some branch on the sign
        EXPECT_EQ(f.run(&image, strength), &image);
        EXPECT_EQ(image.GetBits(), buffer.data());
        ASSERT_EQ(buffer, original);
      }
    }
  }
  // Nor does dehaze find a dark channel in them.
  for (const auto& h : headers) {
    std::vector<uint8_t> buffer = NoiseBytes(512, 2);
    uint8_t* bits = buffer.data();
    CxImage image(&bits, h.width, h.height, h.bpp, h.effWidth, h.format);
    uint32_t maxRGB = 7, maxDark = 7;
    EXPECT_EQ(getMinDarkChannel(&image, &maxRGB, &maxDark), nullptr) << h.name;
    EXPECT_EQ(maxRGB + maxDark, 0u) << h.name;
  }
}

TEST(CalContrastColor, GivesTheExactLimitedResultForAnyLimits) {
  const struct {
    int lo, hi, d, channel, expected;
  } cases[] = {
      {120, 127, 15, 127, 119},           // the steepest ramp contrastAdjustment derives
      {INT_MIN, INT_MAX, 0, 100, 255},    // 0 - INT_MIN
      {-1, 0, INT_MAX, 255, 255},         // 255 * INT_MAX / 255 + 1
      {0, 0, INT_MIN, 200, 0},            // 200 * INT_MIN / 255
      {1, INT_MAX, 0, 100, 255},          // no ramp at all
      {INT_MIN + 1, 0, INT_MAX, 0, 255},  // 0 - (INT_MIN + 1)
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << "lo " << c.lo << ", hi " << c.hi << ", d " << c.d);
    const uint8_t v = static_cast<uint8_t>(c.channel);
    const tagRGBQUAD out = calContrastColor(tagRGBQUAD{v, v, v, 9}, c.lo, c.hi, c.d);
    EXPECT_EQ(out.rgbBlue, c.expected);
    EXPECT_EQ(out.rgbRed, c.expected);
    EXPECT_EQ(out.rgbReserved, 9);
  }
}

}  // namespace
