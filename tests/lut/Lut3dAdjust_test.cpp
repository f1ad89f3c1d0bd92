// The lut3d_ twins against their image forms: point by point on a lattice of whole levels, and
// as a baked chain applied by doLUT against the effects themselves.
#include "tessarofx/Lut3dAdjust.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <functional>
#include <memory>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "support/EffectHarness.h"
#include "support/ImageBuilders.h"
#include "tessarofx/ColorAdjust.h"
#include "tessarofx/LightAdjust.h"
#include "tessarofx/WhiteBalance.h"

namespace {

constexpr int kN = 32;
constexpr int kCap = CubeLut::kMaxSize;

float* Point(CubeLut* lut, int i, int j, int k) {
  return lut->getLut3DData(nullptr, nullptr, nullptr, nullptr) + ((i * kCap + j) * kCap + k) * 3;
}

// The identity of size 32 with its points on whole levels (reset() truncates i * 255 / 31), so
// that an image form, which only takes bytes, can be given exactly each point's colour.
std::unique_ptr<CubeLut> WholeLevelIdentity() {
  auto lut = std::make_unique<CubeLut>();
  lut->generateLUT3DData(kN);
  lut->reset();
  return lut;
}

// One BGRA pixel per lattice point, in the lattice's i, j, k order.
std::vector<uint8_t> PointColours(CubeLut* lut) {
  std::vector<uint8_t> pixels;
  for (int i = 0; i < kN; ++i) {
    for (int j = 0; j < kN; ++j) {
      for (int k = 0; k < kN; ++k) {
        const float* p = Point(lut, i, j, k);
        pixels.insert(pixels.end(), {static_cast<uint8_t>(p[2]), static_cast<uint8_t>(p[1]),
                                     static_cast<uint8_t>(p[0]), 255});
      }
    }
  }
  return pixels;
}

struct Twin {
  const char* name;
  std::function<void(CxImage*, float)> image;
  std::function<CubeLut*(CubeLut*, float)> lattice;
  std::vector<float> strengths;
  // How far above the image form's byte the twin's value may lie, and how far below; above 1,
  // below 0 means "the image value is the twin's value truncated".
  float above;
  float below;
  // The share of channels allowed beyond those bounds, where the image form has no stable
  // value to compare with.
  double share = 0;
};

void TemperatureImage(CxImage* image, float t) {
  temperatureAdjustment(image, static_cast<long>(t));
}

CubeLut* TemperatureLattice(CubeLut* lut, float t) {
  return lut3d_temperatureAdjustment(lut, static_cast<long>(t));
}

std::vector<Twin> Twins() {
  // Strengths cover both signs, each operation's limits and, for contrast, the clamped
  // stretch (184 and up) with its jump at 127.
  const std::vector<float> common = {-100, -37.5f, -1, 1, 45, 100};
  return {
      {"exposure", exposureAdjustment, lut3d_exposureAdjustment, {-100, -20, 0.5f, 20, 100}, 1, 0},
      {"brightness", brightnessAdjustment, lut3d_brightnessAdjustment, common, 1, 0},
      {"contrast", contrastAdjustment, lut3d_contrastAdjustment, {-100, -30, 30, 100, 200}, 1, 0},
      {"saturation", saturationAdjustment, lut3d_saturationAdjustment, common, 1, 0},
      {"highlight", hdrHighlight, lut3d_hdrHighlight, common, 1, 0},
      {"shadow", hdrShadow, lut3d_hdrShadow, common, 1, 0},
      {"white level", hdrWhiteLevel, lut3d_hdrWhiteLevel, common, 1, 0},
      {"black level", hdrBlackLevel, lut3d_hdrBlackLevel, common, 1, 0},
      // The effect's balance for a = temperature / 200, b = tint / 200.
      {"balance (a)",
       [](CxImage* image, float a) {
         cv::Mat m(static_cast<int>(image->GetHeight()), static_cast<int>(image->GetWidth()),
                   CV_8UC4, image->GetBits());
         AdjustWhiteBalance().Process(m, m, ColorGain{1, 1, 1}, a, 0.25f);
       },
       [](CubeLut* lut, float a) { return lut3d_adjustWhiteBalance(lut, a, 0.25f); },
       {-0.5f, 0, 0.2f, 0.5f},
       1,
       0},
      // The image form floors the lightness (half a level) and its mask luma, truncates the
      // weight k (so k may be up to 2 lower) and floors the result: 1 + 127.5 * 2 / 256 +
      // 0.5 * 205 / 256 above, the lightness term below.
      {"vibrance", vibranceAdjustment, lut3d_vibranceAdjustment, common, 2.4f, 1},
      // The image form floors the luma Y and the shift (Y * k) >> 8, |k| <= 39 here:
      // 1 + 39 / 256 above, 39 / 256 below.
      {"tint", tintAdjustment, lut3d_tintAdjustment, common, 1.16f, 0.16f},
      // The image form truncates the tinted channel and the blend, rounds hue and saturation to
      // bytes (1.41 degrees, 1/255) and truncates each output: at full chroma a hue step alone
      // is 255 * 1.41 / 60 = 6 levels. Bounded while the blend weight is at most 1 (t from
      // 7735 to 13365).
      {"temperature",
       TemperatureImage,
       TemperatureLattice,
       {7800, 9000, 11499, 11501, 13300},
       10,
       10},
      // Beyond that the blend extrapolates and can crush a colour to within a level of black,
      // where HSL saturation is undefined: one level in the image form's blend turns a result
      // grey that the twin keeps coloured. Only the share of such channels is bounded.
      {"temperature, extrapolating",
       TemperatureImage,
       TemperatureLattice,
       {2000, 14000, 30000},
       8,
       8,
       0.02}};
}

TEST(Lut3dAdjust, AgreesWithTheImageFormOnEveryPointOfAWholeLevelLattice) {
  for (const Twin& twin : Twins()) {
    for (float strength : twin.strengths) {
      SCOPED_TRACE(std::string(twin.name) + " " + std::to_string(strength));
      auto lut = WholeLevelIdentity();
      std::vector<uint8_t> pixels = PointColours(lut.get());
      uint8_t* bits = pixels.data();
      CxImage image(&bits, kN * kN, kN, 32, kN * kN * 4, IPF_BGRA);
      twin.image(&image, strength);
      ASSERT_EQ(twin.lattice(lut.get(), strength), lut.get());

      float worstAbove = 0, worstBelow = 0;
      size_t at = 0, beyond = 0;
      for (int i = 0; i < kN; ++i) {
        for (int j = 0; j < kN; ++j) {
          for (int k = 0; k < kN; ++k, at += 4) {
            const float* p = Point(lut.get(), i, j, k);
            for (int c = 0; c < 3; ++c) {
              const float diff = p[c] - static_cast<float>(pixels[at + 2 - c]);
              if (twin.share > 0 && (diff > twin.above || -diff > twin.below)) {
                ++beyond;
                continue;
              }
              worstAbove = std::max(worstAbove, diff);
              worstBelow = std::max(worstBelow, -diff);
            }
          }
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
  const std::vector<std::pair<const char*, std::function<CubeLut*(CubeLut*)>>> neutral = {
      {"exposure", [](CubeLut* l) { return lut3d_exposureAdjustment(l, 0); }},
      {"brightness", [](CubeLut* l) { return lut3d_brightnessAdjustment(l, 0); }},
      {"contrast", [](CubeLut* l) { return lut3d_contrastAdjustment(l, 0); }},
      {"vibrance", [](CubeLut* l) { return lut3d_vibranceAdjustment(l, 0); }},
      {"saturation", [](CubeLut* l) { return lut3d_saturationAdjustment(l, 0); }},
      {"highlight", [](CubeLut* l) { return lut3d_hdrHighlight(l, 0); }},
      {"shadow", [](CubeLut* l) { return lut3d_hdrShadow(l, 0); }},
      {"white level", [](CubeLut* l) { return lut3d_hdrWhiteLevel(l, 0); }},
      {"black level", [](CubeLut* l) { return lut3d_hdrBlackLevel(l, 0); }},
      {"balance", [](CubeLut* l) { return lut3d_adjustWhiteBalance(l, 0, 0); }},
      {"temperature", [](CubeLut* l) { return lut3d_temperatureAdjustment(l, 11500); }},
      {"tint", [](CubeLut* l) { return lut3d_tintAdjustment(l, 0); }},
  };
  // Points outside 0..255, which a clamping formula would move even at strength 0.
  auto lut = std::make_unique<CubeLut>();
  lut->generateLUT3DData(17);
  Point(lut.get(), 16, 16, 16)[0] = 300.0f;
  Point(lut.get(), 3, 0, 5)[2] = -7.5f;
  const size_t latticeBytes = sizeof(float) * kCap * kCap * kCap * 3;
  std::vector<uint8_t> lattice(latticeBytes);
  std::memcpy(lattice.data(), Point(lut.get(), 0, 0, 0), latticeBytes);
  int atlasBytes = 0;
  const uint8_t* atlas = lut->getAtlasData(&atlasBytes);
  const std::vector<uint8_t> atlasBefore(atlas, atlas + atlasBytes);
  auto empty = std::make_unique<CubeLut>();  // size 0: no points at all

  for (const auto& [name, call] : neutral) {
    SCOPED_TRACE(name);
    EXPECT_EQ(call(lut.get()), lut.get());
    EXPECT_EQ(std::memcmp(lattice.data(), Point(lut.get(), 0, 0, 0), latticeBytes), 0);
    EXPECT_EQ(std::memcmp(atlasBefore.data(), lut->getAtlasData(nullptr), atlasBefore.size()), 0);
    EXPECT_EQ(call(nullptr), nullptr);
    EXPECT_EQ(call(empty.get()), empty.get());
  }
  // A non-neutral strength on a null or empty lut is just as harmless.
  EXPECT_EQ(lut3d_exposureAdjustment(nullptr, 40), nullptr);
  EXPECT_EQ(lut3d_temperatureAdjustment(empty.get(), 3000), empty.get());
}

TEST(Lut3dAdjust, KeepsTheAtlasInStepWithTheLattice) {
  auto lut = std::make_unique<CubeLut>();
  lut->generateLUT3DData(8);
  lut3d_exposureAdjustment(lut3d_saturationAdjustment(lut.get(), 60), 35);
  int bytes = 0;
  const uint8_t* atlas = lut->getAtlasData(&bytes);
  ASSERT_EQ(bytes, 8 * 8 * 8 * 3);
  for (int k = 0; k < 8; ++k) {
    for (int j = 0; j < 8; ++j) {
      for (int i = 0; i < 8; ++i) {
        // Blue slice k is tile k % 8 of row k / 8; inside it x is red, y green.
        const uint8_t* a = atlas + ((k % 8 + (k / 8 * 8 + j) * 8) * 8 + i) * 3;
        const float* p = Point(lut.get(), i, j, k);
        for (int c = 0; c < 3; ++c) EXPECT_EQ(a[c], static_cast<uint8_t>(p[c]));
      }
    }
  }
}

// Runs one effect over a packed BGRA buffer in place, as a host would.
void RunEffect(const wchar_t* guid, const tfx_test::EffectParams& params, int width, int height,
               std::vector<uint8_t>* pixels) {
  NLEComPtr<INLECGFilter> filter = tfx_test::CreateEffect(guid, tfx_test::Settings(params));
  ASSERT_TRUE(filter);
  TestFrame* fg = new TestFrame(width, height);
  TestFrame* dst = new TestFrame(width, height);
  NLEComPtr<INLEFrame> h1(fg), h2(dst);
  fg->pixels = *pixels;
  filter->SetForeground(fg);
  ASSERT_EQ(filter->Running(dst), NLE_S_OK);
  *pixels = dst->pixels;
}

// The demo's grade as twins, in the effects' order: ColorAdjust, LightAdjust, WhiteBalanceAdjust.
void BakeDemoGrade(CubeLut* lut) {
  lut3d_exposureAdjustment(lut, 20);
  lut3d_contrastAdjustment(lut, 30);
  lut3d_vibranceAdjustment(lut, 40);
  lut3d_saturationAdjustment(lut, 20);
  lut3d_hdrHighlight(lut, -40);
  lut3d_hdrShadow(lut, 50);
  lut3d_hdrWhiteLevel(lut, 20);
  lut3d_hdrBlackLevel(lut, -20);
  lut3d_adjustWhiteBalance(lut, 40.0f / 200.0f, 10.0f / 200.0f);
}

struct Gap {
  int worst = 0;
  double mean = 0;
};

// |a - b| over the colour bytes of two BGRA buffers.
Gap Compare(const std::vector<uint8_t>& a, const std::vector<uint8_t>& b) {
  Gap gap;
  size_t channels = 0;
  for (size_t i = 0; i < a.size(); ++i) {
    if (i % 4 == 3) continue;
    const int diff = std::abs(a[i] - b[i]);
    gap.worst = std::max(gap.worst, diff);
    gap.mean += diff;
    ++channels;
  }
  gap.mean /= static_cast<double>(channels);
  return gap;
}

TEST(Lut3dAdjust, BakedChainThroughDoLutIsCloseToTheEffects) {
  const CxImage& all = tfx_test::EveryColour();
  const int width = static_cast<int>(all.GetWidth()), height = static_cast<int>(all.GetHeight());
  const std::vector<uint8_t> source(all.GetBits(), all.GetBits() + all.GetSize());
  std::vector<uint8_t> direct = source;
  RunEffect(L"18C6E879-4138-42D0-B0B9-6B4401AA97E6",
            {{L"u_exposure", 20}, {L"u_contrast", 30}, {L"u_vib", 40}, {L"u_sat", 20}}, width,
            height, &direct);
  RunEffect(
      L"D8651B53-F47A-4B98-B8E9-35B491D5EADC",
      {{L"u_highLight", -40}, {L"u_shadow", 50}, {L"u_whiteLevel", 20}, {L"u_blackLevel", -20}},
      width, height, &direct);
  RunEffect(L"39509FB9-39FB-4516-9464-3D891DD61D62", {{L"u_temperature", 40}, {L"u_tint", 10}},
            width, height, &direct);

  // The effects floor after each of their nine operations, and the steep ones (the shadow lift
  // doubles the darkest levels; vibrance and saturation stretch dark saturated colours) magnify
  // earlier floors: up to 13 levels before any table. Interpolation adds most where the chain
  // bends inside a cell (clipping at 0 and 255, the vibrance weight's step), less as cells shrink.
  for (const auto& [n, worst] : {std::pair{33, 15}, std::pair{64, 13}}) {
    SCOPED_TRACE("size " + std::to_string(n));
    auto lut = std::make_unique<CubeLut>();
    lut->generateLUT3DData(n);
    for (int i = 0; i < n; ++i) {
      for (int j = 0; j < n; ++j) {
        for (int k = 0; k < n; ++k) {
          float* p = Point(lut.get(), i, j, k);
          p[0] = static_cast<float>(i) * 255.0f / static_cast<float>(n - 1);
          p[1] = static_cast<float>(j) * 255.0f / static_cast<float>(n - 1);
          p[2] = static_cast<float>(k) * 255.0f / static_cast<float>(n - 1);
        }
      }
    }
    BakeDemoGrade(lut.get());
    std::vector<uint8_t> baked = source;
    ASSERT_EQ(lut->doLUT(baked.data(), width, height, width * 4, 4), 0);
    for (size_t i = 3; i < baked.size(); i += 4) ASSERT_EQ(baked[i], source[i]);
    const Gap total = Compare(baked, direct);
    EXPECT_LE(total.worst, worst);
    EXPECT_LE(total.mean, 2.5);
  }
}

}  // namespace
