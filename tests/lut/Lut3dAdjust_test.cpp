// The lut3d_ twins against their image forms, point by point on a lattice of whole levels; the
// tool's bake tests apply a baked chain against the effects themselves.
#include "tessarofx/Lut3dAdjust.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <functional>
#include <memory>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "support/ImageBuilders.h"
#include "tessarofx/ColorAdjust.h"
#include "tessarofx/LightAdjust.h"
#include "tessarofx/WhiteBalance.h"

namespace {

constexpr int kN = 32;

float* Point(CubeLut* lut, int i, int j, int k) { return tfx_test::LatticePoint(*lut, i, j, k); }

struct Twin {
  const char* name;
  std::function<void(CxImage*, float)> image;
  std::function<CubeLut*(CubeLut*, float)> lattice;
  std::vector<float> strengths;
  // How far the twin's value may lie above and below the image form's byte; (1, 0) means the
  // image value is the twin's value truncated.
  float above, below;
  double share = 0;  // of channels allowed beyond those bounds
};

void TemperatureImage(CxImage* image, float t) {
  temperatureAdjustment(image, static_cast<long>(t));
}

CubeLut* TemperatureLattice(CubeLut* lut, float t) {
  return lut3d_temperatureAdjustment(lut, static_cast<long>(t));
}

std::vector<Twin> Twins() {
  // Both signs and each limit; for contrast the clamped stretch (184 up) with its jump at 127.
  const std::vector<float> common = {-100, -37.5f, -1, 1, 45, 100};
  // The effect's balance for a = temperature / 200, b = tint / 200.
  const auto balance = [](CxImage* image, float a) {
    cv::Mat m(static_cast<int>(image->GetHeight()), static_cast<int>(image->GetWidth()), CV_8UC4,
              image->GetBits());
    AdjustWhiteBalance().Process(m, m, ColorGain{1, 1, 1}, a, 0.25f);
  };
  const auto balanceLattice = [](CubeLut* lut, float a) {
    return lut3d_adjustWhiteBalance(lut, a, 0.25f);
  };
  // Temperature's blend weight is at most 1 for t from 7735 to 13365; beyond, it extrapolates.
  const std::vector<float> blending = {7800, 9000, 11499, 11501, 13300},
                           past = {2000, 14000, 30000};
  return {
      {"exposure", exposureAdjustment, lut3d_exposureAdjustment, {-100, -20, 0.5f, 20, 100}, 1, 0},
      {"brightness", brightnessAdjustment, lut3d_brightnessAdjustment, common, 1, 0},
      {"contrast", contrastAdjustment, lut3d_contrastAdjustment, {-100, -30, 30, 100, 200}, 1, 0},
      {"saturation", saturationAdjustment, lut3d_saturationAdjustment, common, 1, 0},
      {"highlight", hdrHighlight, lut3d_hdrHighlight, common, 1, 0},
      {"shadow", hdrShadow, lut3d_hdrShadow, common, 1, 0},
      {"white level", hdrWhiteLevel, lut3d_hdrWhiteLevel, common, 1, 0},
      {"black level", hdrBlackLevel, lut3d_hdrBlackLevel, common, 1, 0},
      {"balance (a)", balance, balanceLattice, {-0.5f, 0, 0.2f, 0.5f}, 1, 0},
      // The image form floors the lightness, mask luma, weight (up to 2 lower) and result:
      // 1 + 127.5 * 2 / 256 + 0.5 * 205 / 256 above, the lightness term below.
      {"vibrance", vibranceAdjustment, lut3d_vibranceAdjustment, common, 2.4f, 1},
      // The image form floors the luma and the shift (Y * k) >> 8, |k| <= 39 here: 39 / 256.
      {"tint", tintAdjustment, lut3d_tintAdjustment, common, 1.16f, 0.16f},
      // Hue and saturation go through bytes: a hue step (1.41 degrees) is 6 levels at full chroma.
      {"temperature", TemperatureImage, TemperatureLattice, blending, 10, 10},
      // Extrapolating, the blend can crush a colour to within a level of black, where one level
      // turns the image form's result grey: only the share of such channels is bounded.
      {"temperature, extrapolating", TemperatureImage, TemperatureLattice, past, 8, 8, 0.02}};
}

TEST(Lut3dAdjust, AgreesWithTheImageFormOnEveryPointOfAWholeLevelLattice) {
  for (const Twin& twin : Twins()) {
    for (float strength : twin.strengths) {
      SCOPED_TRACE(std::string(twin.name) + " " + std::to_string(strength));
      // reset() puts the points on whole levels, so that the image form gets each exactly.
      auto lut = std::make_unique<CubeLut>();
      lut->generateLUT3DData(kN);
      lut->reset();
      std::vector<uint8_t> pixels;  // one BGRA pixel per point, in i, j, k order
      for (int p = 0; p < kN * kN * kN; ++p) {
        const float* v = Point(lut.get(), p / kN / kN, p / kN % kN, p % kN);
        pixels.insert(pixels.end(), {static_cast<uint8_t>(v[2]), static_cast<uint8_t>(v[1]),
                                     static_cast<uint8_t>(v[0]), 255});
      }
      uint8_t* bits = pixels.data();
      CxImage image(&bits, kN * kN, kN, 32, kN * kN * 4, IPF_BGRA);
      twin.image(&image, strength);
      ASSERT_EQ(twin.lattice(lut.get(), strength), lut.get());
      EXPECT_TRUE(tfx_test::AtlasMatches(*lut));  // the atlas kept in step with the lattice

      float worstAbove = 0, worstBelow = 0;
      size_t beyond = 0;
      for (int p = 0; p < kN * kN * kN; ++p) {
        const float* v = Point(lut.get(), p / kN / kN, p / kN % kN, p % kN);
        for (int c = 0; c < 3; ++c) {
          const float diff = v[c] - static_cast<float>(pixels[p * 4 + 2 - c]);
          if (twin.share > 0 && (diff > twin.above || -diff > twin.below)) {
            ++beyond;
            continue;
          }
          worstAbove = std::max(worstAbove, diff);
          worstBelow = std::max(worstBelow, -diff);
        }
      }
      EXPECT_LE(static_cast<double>(beyond), twin.share * kN * kN * kN * 3);
      if (twin.below == 0) {
        EXPECT_LT(worstAbove, twin.above);
        EXPECT_EQ(worstBelow, 0);
      } else {
        EXPECT_LE(worstAbove, twin.above);
        EXPECT_LE(worstBelow, twin.below);
      }
    }
  }
}

TEST(Lut3dAdjust, NeutralStrengthNullAndEmptyLutsChangeNothing) {
  // Every twin at its neutral strength; the balance twin holds the tint at 0.25, so both go to 0.
  std::vector<std::pair<std::string, std::function<CubeLut*(CubeLut*)>>> neutral = {
      {"balance", [](CubeLut* l) { return lut3d_adjustWhiteBalance(l, 0, 0); }}};
  for (const Twin& twin : Twins()) {
    const std::string name = twin.name;
    const float strength = name.rfind("temperature", 0) == 0 ? 11500 : 0;
    if (name != "balance (a)") {
      neutral.emplace_back(name,
                           [twin, strength](CubeLut* l) { return twin.lattice(l, strength); });
    }
  }
  // Points outside 0..255 (the generated lattice reaches 520), which a clamping formula would
  // move even at strength 0.
  auto lut = std::make_unique<CubeLut>();
  lut->generateLUT3DData(64);
  Point(lut.get(), 3, 0, 5)[2] = -7.5f;
  const float* points = lut->getLut3DData(nullptr, nullptr, nullptr, nullptr);
  const std::vector<float> lattice(points, points + 64 * 64 * 64 * 3);
  int atlasBytes = 0;
  const uint8_t* atlas = lut->getAtlasData(&atlasBytes);
  const std::vector<uint8_t> atlasBefore(atlas, atlas + atlasBytes);
  auto empty = std::make_unique<CubeLut>();  // size 0: no points at all

  for (const auto& [name, call] : neutral) {
    SCOPED_TRACE(name);
    EXPECT_EQ(call(lut.get()), lut.get());
    EXPECT_EQ(std::memcmp(lattice.data(), points, lattice.size() * sizeof(float)), 0);
    EXPECT_EQ(std::memcmp(atlasBefore.data(), lut->getAtlasData(nullptr), atlasBefore.size()), 0);
    EXPECT_EQ(call(nullptr), nullptr);
    EXPECT_EQ(call(empty.get()), empty.get());
  }
  // A non-neutral strength on a null or empty lut is just as harmless.
  EXPECT_EQ(lut3d_exposureAdjustment(nullptr, 40), nullptr);
  EXPECT_EQ(lut3d_temperatureAdjustment(empty.get(), 3000), empty.get());
}

}  // namespace
