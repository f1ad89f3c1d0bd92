// The CubeLut lattice: the interpolation tables, the identity-like lattices and their byte atlas,
// doLUT's refusals and byte conversion, the process-wide instance and clone.
#include "tessarofx/CubeLut.h"

#include <gtest/gtest.h>

#include <array>
#include <climits>
#include <cmath>
#include <cstring>
#include <limits>
#include <memory>
#include <vector>

#include "lut/CubeLutApply.h"
#include "support/EffectHarness.h"
#include "support/EveryTarget.h"
#include "support/ImageBuilders.h"

namespace {

using tfx_test::ForEveryTarget;
constexpr auto At = tfx_test::LatticePoint;

std::unique_ptr<CubeLut> Generated(int n) {
  auto lut = std::make_unique<CubeLut>();
  lut->generateLUT3DData(n);
  return lut;
}

// One BGRA pixel through doLUT.
std::vector<uint8_t> Apply(CubeLut& lut, std::vector<uint8_t> pixel) {
  EXPECT_EQ(0, lut.doLUT(pixel.data(), 1, 1, 4, 4));
  return pixel;
}

tfx::TetraTable Table(CubeLut& lut) {
  return {lut.getLut3DData(nullptr, nullptr, nullptr, nullptr), lut.getFTData(nullptr),
          lut.getGTData(nullptr), lut.getLutSize()};
}

// A size whose positions the rows cannot find by two multiplies falls back to costly gathers.
TEST(CubeLut, TablesPlaceEveryByteInItsCellAndTheRowsFindItByMultiplying) {
  for (int n = 2; n <= 64; ++n) {
    SCOPED_TRACE(n);
    const auto lut = Generated(n);
    int count = 0;
    const float* ft = lut->getFTData(&count);
    ASSERT_EQ(256, count);
    const int* gt = lut->getGTData(nullptr);
    // The float division is kept: at 64 points the last byte lands a hair above the last point.
    EXPECT_EQ(n - 1, gt[255]);
    // The generated lattice divides by 31 whatever the size, past 255 from 33 points on.
    EXPECT_EQ(float(n - 1) * 255.0f / 31.0f, At(*lut, n - 1, 1, 0)[0]);
    const float cell = 255.0f / static_cast<float>(n - 1);
    for (int v = 0; v < 256; ++v) {
      const float s = static_cast<float>(v) / cell;
      ASSERT_EQ(static_cast<int>(std::floor(s)), gt[v]) << v;
      ASSERT_EQ(s - std::floor(s), ft[v]) << v;
    }
    tfx::TetraPlan plan;
    plan.Prepare(Table(*lut));
    EXPECT_NE(plan.Scale(0), 0.0f);
  }
}

// With fr = fg = fb the last case reads C000, C010, C110 and C111; NaN in any other corner would
// make the result NaN, which converts to 0.
TEST(CubeLut, EqualFractionsTakeTheLastCase) {
  const float nan = std::numeric_limits<float>::quiet_NaN();
  auto lut = Generated(17);
  for (int x = 0; x < 8; ++x) {
    for (int ch = 0; ch < 3; ++ch) At(*lut, 6 + (x & 1), 6 + (x >> 1 & 1), 6 + (x >> 2))[ch] = nan;
  }
  // C000, C010, C110 and C111 of cell 6, as (red, green, blue) offsets.
  for (const auto& at : {std::array<int, 3>{0, 0, 0}, {0, 1, 0}, {1, 1, 0}, {1, 1, 1}}) {
    for (int ch = 0; ch < 3; ++ch) At(*lut, 6 + at[0], 6 + at[1], 6 + at[2])[ch] = 100.0f;
  }
  ForEveryTarget([&] {
    // 100 is 6.27 cells: every pixel of equal bytes in cell 6 has equal fractions.
    for (const uint8_t v : {96, 100, 105, 111}) {
      EXPECT_EQ((std::vector<uint8_t>{100, 100, 100, 9}), Apply(*lut, {v, v, v, 9})) << int{v};
    }
  });
}

// The byte a pixel on a lattice point takes from the point's value: +0.5, a cap at 255,
// truncation, and no floor, so negative results wrap.
TEST(CubeLut, ResultsAreRoundedCappedAndWrapped) {
  const float inf = std::numeric_limits<float>::infinity();
  const struct {
    float value;
    uint8_t byte;
  } cases[] = {{0.0f, 0},           {0.49f, 0},         {0.5f, 1},    {127.5f, 128}, {254.49f, 254},
               {254.5f, 255},       {300.0f, 255},      {1e30f, 255}, {-0.5f, 0},    {-1.0f, 0},
               {-1.49f, 0},         {-1.5f, 255},       {-2.0f, 255}, {-255.0f, 2},  {-3e9f, 0},
               {-2147483648.0f, 1}, {std::nanf(""), 0}, {inf, 255},   {-inf, 0}};
  for (const auto& c : cases) EXPECT_EQ(c.byte, tfx::LutComponentToByte(c.value)) << c.value;
}

// Pitch padding and bytes past the third stay as they are, whatever the pixel size.
TEST(CubeLut, OnlyTheFirstThreeBytesOfEachPixelChange) {
  const auto lut = Generated(17);
  const tfx::TetraTable table = Table(*lut);
  for (const int bpp : {3, 4, 5}) {
    const int width = 37, height = 5, pitch = width * bpp + 11;
    std::vector<uint8_t> expected = tfx_test::NoiseBytes(static_cast<size_t>(pitch) * height, bpp);
    std::vector<uint8_t> after = expected;
    EXPECT_EQ(0, lut->doLUT(after.data(), width, height, pitch, bpp));
    for (int y = 0; y < height; ++y) {
      tfx::TetraRowReference(table, &expected[pitch * y], width, bpp);
    }
    EXPECT_EQ(expected, after) << bpp;
  }
}

TEST(CubeLut, RefusalsLeaveThePixelsAlone) {
  const std::vector<uint8_t> pixels = tfx_test::NoiseBytes(64 * 4, 5);
  std::vector<uint8_t> work = pixels;
  auto fresh = std::make_unique<CubeLut>();
  EXPECT_EQ(1, fresh->getStatus());
  EXPECT_EQ(23, fresh->doLUT(work.data(), 64, 1, 256, 4));
  EXPECT_EQ(0, fresh->getStatus());  // cleared before the size check
  fresh->generateLUT3DData(65);      // more than the lattice holds: not taken
  EXPECT_EQ(0, fresh->getLutSize());
  EXPECT_EQ(23, fresh->doLUT(work.data(), 64, 1, 256, 4));
  auto lut = Generated(2);  // maps 255 to 8: every applied pixel would change
  lut->setRowTable(new float[8][3]());
  EXPECT_EQ(0, lut->doLUT(work.data(), 64, 1, 256, 4));
  EXPECT_EQ(pixels, work);
  lut->setRowTable(nullptr);
  EXPECT_EQ(0, lut->doLUT(work.data(), 64, 1, 256, 4));
  EXPECT_NE(pixels, work);

  // Given exactly the bytes a sound call would need, so that any overreach is out of bounds.
  struct Case {
    const char* name;
    bool null;
    int width, height, pitch, bytesPerPixel;
  };
  for (const Case& c : {Case{"null pixels", true, 4, 2, 16, 4},
                        {"no rows", false, 4, 0, 16, 4},
                        {"negative height", false, 4, -3, 16, 4},
                        {"pitch below a row", false, 4, 2, 15, 4},
                        {"negative short pitch", false, 4, 2, -8, 4},
                        {"zero width", false, 0, 2, 16, 4},
                        {"two bytes a pixel", false, 4, 2, 16, 2},
                        {"negative width", false, -4, 2, 16, 4},
                        {"rows past INT_MAX bytes", false, 4, 3, INT_MAX / 2 + 1, 4}}) {
    SCOPED_TRACE(c.name);
    std::vector<uint8_t> bytes(32, 255);
    uint8_t* start = c.pitch < 0 ? bytes.data() + 16 : bytes.data();
    EXPECT_EQ(lut->doLUT(c.null ? nullptr : start, c.width, c.height, c.pitch, c.bytesPerPixel), 0);
    EXPECT_EQ(bytes, std::vector<uint8_t>(32, 255));
  }
  std::vector<uint8_t> row(12, 255);
  EXPECT_EQ(lut->doLUT(row.data(), 3, 1, 0, 4), 0);  // one row needs no pitch
  EXPECT_EQ(row[0], 8);
  // One point per axis: every colour maps to it.
  EXPECT_EQ((std::vector<uint8_t>{0, 0, 0, 4}), Apply(*Generated(1), {255, 128, 3, 4}));
}

TEST(CubeLut, LastConstructedObjectIsTheInstanceAndCloneCopiesAllButTheRowTable) {
  CubeLut::releaseInstance();
  CubeLut* made = CubeLut::getInstance();
  ASSERT_NE(nullptr, made);
  EXPECT_EQ(0, made->getLutSize());
  EXPECT_EQ(made, CubeLut::getInstance());
  CubeLut::releaseInstance();
  CubeLut::releaseInstance();  // nothing registered: nothing to do

  auto lut = Generated(5);
  EXPECT_EQ(lut.get(), CubeLut::getInstance());
  At(*lut, 4, 3, 2)[1] = -7.25f;
  lut->updateCalcuatedData(2, 3, 4, CubeLut::PR{1.0f, 2.0f, 3.0f});
  lut->setRowTable(new float[4][3]());
  std::unique_ptr<CubeLut> copy(lut->clone());
  EXPECT_EQ(copy.get(), CubeLut::getInstance());
  EXPECT_EQ(nullptr, copy->getRowTable());
  EXPECT_NE(nullptr, lut->getRowTable());
  EXPECT_EQ(5, copy->getLutSize());
  EXPECT_EQ(0, std::memcmp(lut->getFTData(nullptr), copy->getFTData(nullptr), 256 * sizeof(float)));
  EXPECT_EQ(0, std::memcmp(lut->getGTData(nullptr), copy->getGTData(nullptr), 256 * sizeof(int)));
  EXPECT_EQ(-7.25f, At(*copy, 4, 3, 2)[1]);
  int bytes = 0, copyBytes = 0;
  const uint8_t* atlas = lut->getAtlasData(&bytes);
  const uint8_t* copyAtlas = copy->getAtlasData(&copyBytes);
  ASSERT_EQ(bytes, copyBytes);
  EXPECT_NE(atlas, copyAtlas);
  EXPECT_EQ(0, std::memcmp(atlas, copyAtlas, static_cast<size_t>(bytes)));
  // The copy, without a row table, applies the lattice the original refuses to.
  EXPECT_EQ((std::vector<uint8_t>{255, 255, 255, 0}), Apply(*lut, {255, 255, 255, 0}));
  EXPECT_EQ((std::vector<uint8_t>{33, 33, 33, 0}), Apply(*copy, {255, 255, 255, 0}));  // 4*255/31

  // The registered object is gone; the instance is a new one, not the destroyed copy.
  copy.reset();
  EXPECT_EQ(0, CubeLut::getInstance()->getLutSize());
  CubeLut::releaseInstance();
}

TEST(CubeLutInstance, NeverHandsOutOrDestroysAFiltersTable) {
  CubeLut::releaseInstance();
  CubeLut* hosts = new CubeLut();  // the host's own, now the instance
  NLEComPtr<INLECGFilter> keyer = tfx_test::CreateEffect(
      tfx_test::kChromeKey, tfx_test::Settings({{L"green", 200}, {L"contrast", 50}, {L"mode", 0}}));
  NLEComPtr<INLECGFilter> lut = tfx_test::CreateEffect(
      tfx_test::kLut, tfx_test::TextSettings(L"lut3dPath", L"/nonexistent.cube"));
  // The keyer's mask, then the LUT filter, whose unreadable file passes frames through.
  const auto run = [&] {
    const tfx_test::Bytes fg(7 * 3 * 4, 90);
    EXPECT_EQ(tfx_test::RunFrame(lut.get(), new TestFrame(7, 3, fg), new TestFrame(7, 3)), fg);
    return tfx_test::RunFrame(keyer.get(), new TestFrame(7, 3, fg), new TestFrame(7, 3));
  };
  const tfx_test::Bytes first = run();
  EXPECT_EQ(CubeLut::getInstance(), hosts);
  // Under the sanitizers a filter whose table had been released would read freed memory here.
  CubeLut::releaseInstance();
  CubeLut::releaseInstance();
  EXPECT_EQ(run(), first);
}

// Every point has its texel even when N is not a multiple of 8 and the last tile row is part empty.
TEST(CubeLut, AtlasHoldsTheLatticeInTilesAndResetWritesTheIntegerPattern) {
  for (const int n : {2, 8, 17, 32, 33}) EXPECT_TRUE(tfx_test::AtlasMatches(*Generated(n))) << n;
  // The first argument is the blue index, the third the red; values keep their low 8 bits.
  auto lut = Generated(17);
  lut->updateCalcuatedData(9, 2, 5, CubeLut::PR{300.9f, -1.5f, 7.0f});
  const uint8_t* a = lut->getAtlasData(nullptr) + ((9 % 8 + (9 / 8 * 17 + 2) * 8) * 17 + 5) * 3;
  EXPECT_EQ(44, a[0]);
  EXPECT_EQ(255, a[1]);
  EXPECT_EQ(7, a[2]);
  // Nothing in the library clears the atlas state, so the atlas is not copied back.
  lut->updateLUT3DData();
  EXPECT_EQ(5.0f * 255.0f / 31.0f, At(*lut, 5, 2, 9)[0]);

  // reset() truncates i * 255 / 31 where generateLUT3DData keeps the fraction, and the atlas
  // follows, 263 keeping its low 8 bits.
  lut = Generated(33);
  At(*lut, 1, 2, 3)[0] = 99.0f;
  lut->reset();
  for (int p = 0; p < 33 * 33 * 33; ++p) {
    const int i = p / 33 / 33, j = p / 33 % 33, k = p % 33;
    const float expected[3] = {float(i * 255 / 31), float(j * 255 / 31), float(k * 255 / 31)};
    ASSERT_EQ(0, std::memcmp(expected, At(*lut, i, j, k), sizeof expected)) << i << j << k;
  }
  EXPECT_TRUE(tfx_test::AtlasMatches(*lut));

  // Without a size there is nothing to reset.
  auto empty = std::make_unique<CubeLut>();
  empty->reset();
  EXPECT_EQ(nullptr, empty->getAtlasData(nullptr));
}

}  // namespace
