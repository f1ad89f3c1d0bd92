#include "lut/ChromeKeyLut3dGenerator.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <memory>
#include <utility>
#include <vector>

#include "tessarofx/CubeLut.h"

namespace {

using Rgb = std::array<int, 3>;

constexpr Rgb kGreenScreen{40, 200, 60};
constexpr Rgb kBlueScreen{30, 60, 200};

lutParam Param(Rgb screen, double contrast = 50.0, double offset = 0.0) {
  return NLEChromeKeyLut3dGenerator::DefaultParam(
      static_cast<uint8_t>(screen[0]), static_cast<uint8_t>(screen[1]),
      static_cast<uint8_t>(screen[2]), contrast, offset);
}

// The two tables as the effects hold them: 64-point CubeLuts filled by the generator.
struct Tables {
  explicit Tables(const lutParam& param) : beauty(new CubeLut), alpha(new CubeLut) {
    beauty->generateLUT3DData(64);
    alpha->generateLUT3DData(64);
    NLEChromeKeyLut3dGenerator generator;
    generator.setLutParam(param);
    generator.getBeautyLut(beauty->getLut3DData(nullptr, nullptr, nullptr, nullptr));
    generator.getAlphaLut(alpha->getLut3DData(nullptr, nullptr, nullptr, nullptr));
  }

  static Rgb Apply(CubeLut& lut, Rgb c) {
    uint8_t px[4] = {static_cast<uint8_t>(c[2]), static_cast<uint8_t>(c[1]),
                     static_cast<uint8_t>(c[0]), 77};
    EXPECT_EQ(lut.doLUT(px, 1, 1, 4, 4), 0);
    EXPECT_EQ(px[3], 77);
    return {px[2], px[1], px[0]};
  }
  Rgb Beauty(Rgb c) { return Apply(*beauty, c); }
  // The mask, checked to be the same in all three components.
  int Alpha(Rgb c) {
    const Rgb m = Apply(*alpha, c);
    EXPECT_TRUE(m[0] == m[1] && m[1] == m[2]) << m[0] << " " << m[1] << " " << m[2];
    return m[2];
  }

  std::unique_ptr<CubeLut> beauty, alpha;
};

Rgb Mix(Rgb a, Rgb b, double t) {  // (1 - t) * a + t * b
  Rgb m;
  for (int c = 0; c < 3; ++c) m[c] = static_cast<int>(a[c] + (b[c] - a[c]) * t + 0.5);
  return m;
}

int MaxDiff(Rgb a, Rgb b) {
  int d = 0;
  for (int c = 0; c < 3; ++c) d = std::max(d, std::abs(a[c] - b[c]));
  return d;
}

TEST(ChromeKeyLut3dGenerator, KeysTheScreenAndLeavesWhatIsUnlikeItAlone) {
  // Every grey, skin and hues far from both screens used here.
  std::vector<Rgb> kept = {{92, 60, 48},   {198, 148, 122}, {234, 196, 176},
                           {214, 40, 40},  {230, 200, 30},  {200, 60, 170},
                           {235, 130, 30}, {60, 38, 24},    {250, 170, 170}};
  for (int v = 0; v < 256; ++v) kept.push_back({v, v, v});
  for (Rgb screen : {kGreenScreen, kBlueScreen}) {
    SCOPED_TRACE(screen[2]);
    Tables t(Param(screen));
    EXPECT_EQ(t.Alpha(screen), 0);
    // An unevenly lit screen stays keyed: 20 % darker, 10 % brighter, more saturated.
    EXPECT_EQ(t.Alpha(Mix({0, 0, 0}, screen, 0.8)), 0);
    EXPECT_EQ(t.Alpha(Mix({0, 0, 0}, screen, 1.1)), 0);
    EXPECT_EQ(t.Alpha(Mix(screen, {255, 255, 255}, -0.1)), 0);
    for (Rgb c : kept) {
      ASSERT_EQ(t.Alpha(c), 255) << c[0] << "," << c[1] << "," << c[2];
      ASSERT_LE(MaxDiff(t.Beauty(c), c), 1) << c[0] << "," << c[1] << "," << c[2];
    }
  }
  // The red index is outermost: the blue screen with red and blue swapped is an orange to keep.
  EXPECT_EQ(Tables(Param(kBlueScreen)).Alpha({200, 60, 30}), 255);
}

// A pixel that is part grey subject and part screen has that part of the screen's chroma, so the
// mask follows the mix; contrast steepens the ramp around the middle and offset moves it.
TEST(ChromeKeyLut3dGenerator, AlphaFollowsTheScreenShareShapedByContrastAndOffset) {
  const Rgb grey{200, 200, 200};  // as bright as the screen, so no shadow allowance applies
  const Rgb half = Mix(grey, kGreenScreen, 0.5), quarter = Mix(grey, kGreenScreen, 0.25),
            most = Mix(grey, kGreenScreen, 0.75);
  const struct {
    double contrast, offset;
    int quarter, half, most;  // expected alphas
    int near;  // the steeper the ramp, the more interpolation between lattice points shows
  } cases[] = {
      {0, 0, 191, 128, 64, 3},  // linear: alpha = 1 - share
      {50, 0, 255, 128, 0, 3},  // the default: the ramp runs from a quarter to three quarters
      {50, 40, 255, 230, 102, 3}, {50, -40, 153, 26, 0, 3}, {90, 0, 255, 128, 0, 8},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << "contrast " << c.contrast << " offset " << c.offset);
    Tables t(Param(kGreenScreen, c.contrast, c.offset));
    EXPECT_NEAR(t.Alpha(quarter), c.quarter, c.near);
    EXPECT_NEAR(t.Alpha(half), c.half, c.near);
    EXPECT_NEAR(t.Alpha(most), c.most, c.near);
  }
  // Full contrast gives a hard matte.
  NLEChromeKeyLut3dGenerator generator;
  generator.setLutParam(Param(kGreenScreen, 100.0));
  std::vector<float> lattice(64 * 64 * 64 * 3);
  generator.getAlphaLut(lattice.data());
  for (float v : lattice) ASSERT_TRUE(v == 0.0f || v == 255.0f) << v;
  EXPECT_EQ(lattice[(0 * 64 + 63) * 64 * 3], 0.0f);    // pure green
  EXPECT_EQ(lattice[(63 * 64 + 0) * 64 * 3], 255.0f);  // pure red
}

TEST(ChromeKeyLut3dGenerator, WindowsHueRangeAndAGreyScreenProtectColours) {
  lutParam p = Param(kGreenScreen);
  p.saturationHigh = 150;  // the screen's saturation is 204
  EXPECT_EQ(Tables(p).Alpha(kGreenScreen), 255);
  p = Param(kGreenScreen);
  p.valueLow = 210;  // the screen's value is 200
  EXPECT_EQ(Tables(p).Alpha(kGreenScreen), 255);
  p.valueLow = 0;
  p.valueHigh = 190;
  Tables high(p);
  EXPECT_EQ(high.Alpha(kGreenScreen), 255);
  EXPECT_EQ(high.Alpha(Mix({0, 0, 0}, kGreenScreen, 0.8)), 0);

  // Saturated hues over 70 degrees from the screen's are never keyed; 25 and 35 away are.
  Tables t(Param({0, 255, 0}));
  EXPECT_EQ(t.Alpha({255, 202, 0}), 255);  // hue 48
  EXPECT_EQ(t.Alpha({0, 195, 255}), 255);  // hue 194
  EXPECT_EQ(t.Alpha({106, 255, 0}), 0);    // hue 95
  EXPECT_EQ(t.Alpha({0, 255, 149}), 0);    // hue 155

  // A grey screen keys nothing.
  Tables grey(Param({90, 90, 90}));
  for (Rgb c : {Rgb{90, 90, 90}, kGreenScreen, kBlueScreen, Rgb{0, 0, 0}}) {
    EXPECT_EQ(grey.Alpha(c), 255);
    EXPECT_LE(MaxDiff(grey.Beauty(c), c), 1);
  }
}

// At full strength no colour keeps the screen's cast: its channel never ends above both others.
TEST(ChromeKeyLut3dGenerator, BeautyLeavesNoColourWithTheScreensCast) {
  std::vector<uint8_t> cube;  // every third level of each channel, as BGRA
  for (int p = 0; p < 86 * 86 * 86; ++p) {
    cube.insert(cube.end(),
                {static_cast<uint8_t>(p % 86 * 3), static_cast<uint8_t>(p / 86 % 86 * 3),
                 static_cast<uint8_t>(p / 86 / 86 * 3), 255});
  }
  const int pixels = static_cast<int>(cube.size() / 4);
  for (const auto& [screen, cast] : {std::pair{kGreenScreen, 1}, std::pair{kBlueScreen, 0}}) {
    std::vector<uint8_t> out = cube;
    Tables(Param(screen)).beauty->doLUT(out.data(), pixels, 1, pixels * 4, 4);
    int worst = 0;  // how far the screen's channel ends above both others
    for (size_t p = 0; p < out.size(); p += 4) {
      worst = std::max(worst,
                       out[p + cast] - std::max(out[p + (cast + 1) % 3], out[p + (cast + 2) % 3]));
    }
    // Interpolation between lattice points leaves a few levels.
    EXPECT_LE(worst, 3) << cast;
  }
}

TEST(ChromeKeyLut3dGenerator, SpillStrengthAndLuminanceRestore) {
  const Rgb spilled{150, 200, 120};  // a warm colour with green spill, hue 98
  lutParam p = Param(kGreenScreen);
  p.spillStrength = 0.0;
  EXPECT_LE(MaxDiff(Tables(p).Beauty(spilled), spilled), 1);

  p = Param(kGreenScreen);
  const Rgb halfRestore = Tables(p).Beauty(spilled);
  p.lumaRestore = 100.0;
  const Rgb fullRestore = Tables(p).Beauty(spilled);
  p.lumaRestore = 0.0;
  const Rgb noRestore = Tables(p).Beauty(spilled);
  auto value = [](Rgb c) { return std::max({c[0], c[1], c[2]}); };
  EXPECT_NEAR(value(fullRestore), 200, 1);
  EXPECT_LT(value(noRestore), value(halfRestore));
  EXPECT_LT(value(halfRestore), value(fullRestore));
  for (Rgb c : {halfRestore, fullRestore, noRestore}) {
    EXPECT_LE(c[1], std::max(c[0], c[2]) + 1);
    EXPECT_GE(c[0], c[2]);  // pushed towards yellow, the side it came from
  }
}

}  // namespace
