// The vector tetrahedral rows against the per-pixel reference, on every instruction set: random
// and hostile lattices, every tail length, 3- and 4-byte pixels, and every colour.
#include "lut/CubeLutApply.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>
#include <memory>
#include <random>
#include <vector>

#include "simd/lut_tetra_rows.h"
#include "support/EveryTarget.h"
#include "support/ImageBuilders.h"
#include "tessarofx/CubeLut.h"

namespace {

using tfx_test::ForEveryTarget;

// A CubeLut of size n whose tables come from generateLUT3DData and whose lattice is rewritten.
struct Lattice {
  std::unique_ptr<CubeLut> lut = std::make_unique<CubeLut>();

  explicit Lattice(int n) { lut->generateLUT3DData(n); }
  // Random values a little beyond the byte range.
  Lattice(int n, std::mt19937& rng) : Lattice(n) {
    std::uniform_real_distribution<float> value(-20.0f, 280.0f);
    Fill([&] { return value(rng); });
  }

  float* Point(int i, int j, int k) { return tfx_test::LatticePoint(*lut, i, j, k); }

  // Grey: every point's three components the same value, as in a key mask.
  template <class Value>
  void Fill(Value value, bool grey = false) {
    const int n = lut->getLutSize();
    for (int p = 0; p < n * n * n; ++p) {
      float* point = Point(p / n / n, p / n % n, p % n);
      for (int c = 0; c < 3; ++c) point[c] = grey && c ? point[0] : value();
    }
  }

  tfx::TetraTable Table() {
    return {lut->getLut3DData(nullptr, nullptr, nullptr, nullptr), lut->getFTData(nullptr),
            lut->getGTData(nullptr), lut->getLutSize()};
  }
};

// Values where the byte conversion changes behaviour: rounding at .5, the clamp at 255, the
// wrap below 0, the float and int32 limits, NaN and the infinities.
std::vector<float> EdgeValues() {
  const float inf = std::numeric_limits<float>::infinity();
  const float nan = std::numeric_limits<float>::quiet_NaN();
  std::vector<float> values = {nan, 254.5f, 255.0f, 255.5f, -8388608.0f, -8388607.5f, 8388608.5f};
  for (const float v : {0.0f, 0.5f, 1.0f, 1.5f, 2.0f, 300.0f, 1e30f, 3e9f, 2147483648.0f,
                        8388609.0f, 16777216.0f, 16777218.0f, 1e-45f, inf}) {
    values.insert(values.end(), {v, -v});
  }
  for (const float v : {-0.5f, 0.5f, 254.5f, -1.5f, 127.5f, -2147483648.0f, -8388608.0f}) {
    values.push_back(std::nextafter(v, -inf));
    values.push_back(std::nextafter(v, inf));
  }
  return values;
}

// Random rows of every width to 67 (every tail of every vector size) and one long row, with guard
// bytes behind; odd widths from a copy of the row, the others in place.
void ExpectSameRows(const tfx::TetraTable& table, int bytesPerPixel, uint32_t salt) {
  tfx::TetraPlan plan;
  plan.Prepare(table);
  std::mt19937 rng(salt);
  for (int width = 0; width <= 68; ++width) {
    const int pixels = width < 68 ? width : 4099;
    std::vector<uint8_t> expected(static_cast<size_t>(pixels) * bytesPerPixel + 16);
    for (auto& b : expected) b = static_cast<uint8_t>(rng());
    std::vector<uint8_t> actual = expected;
    const std::vector<uint8_t> in = expected;
    tfx::TetraRowReference(table, expected.data(), pixels, bytesPerPixel);
    tfx::TetraRow(plan, width % 2 ? in.data() : actual.data(), actual.data(), pixels,
                  bytesPerPixel);
    const auto diff = std::mismatch(expected.begin(), expected.end(), actual.begin());
    ASSERT_TRUE(diff.first == expected.end())
        << "width " << pixels << ", " << bytesPerPixel << " bytes per pixel: byte "
        << diff.first - expected.begin() << " is " << int{*diff.second} << ", expected "
        << int{*diff.first};
  }
}

// Hostile lattices hold some edge values among ordinary ones, so that only some corners mix with
// one, and fractions the rows cannot read as positions; grey ones take the one-float-a-point rows.
TEST(CubeLutApply, RandomAndHostileLatticesMatchTheReference) {
  const std::vector<float> edges = EdgeValues();
  for (const int n : {2, 3, 5, 17, 33, 64}) {
    for (const int kind : {0, 1, 2, 3}) {
      const bool hostile = kind % 2, grey = kind / 2;
      SCOPED_TRACE(testing::Message()
                   << n << (hostile ? " hostile" : " random") << (grey ? " grey" : ""));
      Lattice lattice(n);
      std::mt19937 rng(static_cast<uint32_t>(n + 100 * hostile));
      std::uniform_real_distribution<float> value(-40.0f, 300.0f);
      lattice.Fill(
          [&] {
            if (!hostile) return value(rng);
            return rng() % 3 == 0 ? edges[rng() % edges.size()]
                                  : std::ldexp(static_cast<float>(rng() % 4096) - 1024.0f, -2);
          },
          grey);
      if (hostile) {
        // Fractions whose sum with their index no longer gives them back.
        lattice.lut->getFTData(nullptr)[17] = -0.0f;
        lattice.lut->getFTData(nullptr)[200] = 1.5f;
      }
      ForEveryTarget([&] {
        ExpectSameRows(lattice.Table(), 4, 1);
        ExpectSameRows(lattice.Table(), 3, 2);
      });
    }
  }
}

// A lattice too large for the cache goes a slab of red cells at a time: two bands, ragged rows, a
// padded pitch, in place and not; pixels all over the lattice, or all but each row's first in the
// first slab (filling it, with the zeros padding rows to whole vectors, right up to the next), or
// a smooth first band that goes row by row; and an index table whose slabs hold no whole bytes.
TEST(CubeLutApply, ImagesThroughSlabsMatchTheReference) {
  constexpr int kWidth = 1001, kHeight = 1100, kPitch = kWidth * 4 + 12;
  for (const int n : {50, 64, 63}) {
    const bool firstSlab = n == 50, smoothFirstBand = n == 63;
    std::mt19937 rng(static_cast<uint32_t>(n));
    Lattice lattice(n, rng);
    std::vector<uint8_t> source(static_cast<size_t>(kPitch) * kHeight);
    for (size_t i = 0; i < source.size(); ++i) {
      const uint32_t v = rng();
      const size_t x = i % kPitch / 4, y = i / kPitch;
      const bool red = i % 4 == 2, first = x == 0;
      source[i] = static_cast<uint8_t>(firstSlab && red ? (first ? 70 + v % 60 : v % 60) : v);
      if (smoothFirstBand && y < 1000) source[i] = static_cast<uint8_t>(i % 4 ? x / 8 : y / 8);
    }
    std::vector<uint8_t> expected = source;  // the padding between rows stays the caller's
    for (int y = 0; y < kHeight; ++y) {
      tfx::TetraRowReference(lattice.Table(), expected.data() + y * kPitch, kWidth, 4);
    }
    // Both layouts of a point, each read by every instruction set.
    tfx::TetraPlan plan;
    plan.Prepare(lattice.Table(), n == 64 ? 3 : 4);
    ASSERT_GT(plan.Slabs(), 1);
    ForEveryTarget([&] {
      std::vector<uint8_t> inPlace = source, copied(source.size(), 0);
      tfx::TetraImage(plan, inPlace.data(), kPitch, inPlace.data(), kWidth, kHeight, kPitch, 4);
      EXPECT_EQ(inPlace, expected) << n << " in place";
      std::vector<uint8_t> dense(static_cast<size_t>(kWidth) * 4 * kHeight);
      tfx::TetraImage(plan, source.data(), kPitch, dense.data(), kWidth, kHeight, kWidth * 4, 4);
      for (int y = 0; y < kHeight; ++y) {
        ASSERT_EQ(
            0, std::memcmp(dense.data() + y * kWidth * 4, expected.data() + y * kPitch, kWidth * 4))
            << n << " row " << y;
      }
    });
  }
  Lattice lattice(64);
  lattice.lut->getGTData(nullptr)[200] = 3;
  tfx::TetraPlan plan;
  plan.Prepare(lattice.Table());
  EXPECT_EQ(plan.Slabs(), 1);
}

// At N = 52 every multiple of 5 is a lattice point; the corners that weigh 0 have odd indices and
// hold 0, so each even point's value reaches the byte conversion unmixed, NaN and inf included.
TEST(CubeLutApply, LatticePointsConvertLikeTheScalarHelper) {
  const float inf = std::numeric_limits<float>::infinity();
  // First a whole vector from 0 up with the float below 0.5 between, which v + 0.5f rounds to 1.
  std::vector<float> values;
  for (int i = 0; i < 48; ++i) values.push_back(i % 2 ? std::nextafter(0.5f, 0.0f) : i * 0.25f);
  const std::vector<float> edges = EdgeValues();
  values.insert(values.end(), edges.begin(), edges.end());
  for (int k = -300; k <= 300; ++k) {
    for (const float v : {static_cast<float>(k), k + 0.5f}) {
      values.insert(values.end(), {v, std::nextafter(v, -inf), std::nextafter(v, inf)});
    }
  }
  std::mt19937 rng(52);
  while (values.size() < 26 * 26 * 26 * 3) {
    const uint32_t bits = rng();
    float v;
    std::memcpy(&v, &bits, sizeof v);
    values.push_back(v);
  }
  Lattice lattice(52);
  lattice.Fill([] { return 0.0f; });
  std::vector<uint8_t> row, expected;
  size_t next = 0;
  for (int i = 0; i < 52; i += 2) {
    for (int j = 0; j < 52; j += 2) {
      for (int k = 0; k < 52; k += 2) {
        float* point = lattice.Point(i, j, k);
        for (int c = 0; c < 3; ++c) point[c] = values[next++];
        const uint8_t alpha = static_cast<uint8_t>(next);
        const uint8_t pixel[4] = {uint8_t(5 * k), uint8_t(5 * j), uint8_t(5 * i), alpha};
        const uint8_t out[4] = {tfx::LutComponentToByte(point[2]),
                                tfx::LutComponentToByte(point[1]),
                                tfx::LutComponentToByte(point[0]), alpha};
        row.insert(row.end(), pixel, pixel + 4);
        expected.insert(expected.end(), out, out + 4);
      }
    }
  }
  tfx::TetraPlan plan;
  plan.Prepare(lattice.Table());
  ForEveryTarget([&] {
    std::vector<uint8_t> actual = row;
    tfx::TetraRow(plan, actual.data(), actual.data(), static_cast<int>(actual.size() / 4), 4);
    const auto diff = std::mismatch(expected.begin(), expected.end(), actual.begin());
    const size_t p = static_cast<size_t>(diff.first - expected.begin());
    EXPECT_TRUE(diff.first == expected.end())
        << "value " << (p % 4 < 3 ? values[p / 4 * 3 + 2 - p % 4] : 0.0f) << " gives "
        << int{*diff.second} << ", expected " << int{*diff.first};
  });
}

TEST(CubeLutApply, EveryColourMatchesTheReference) {
  std::mt19937 rng(33);
  Lattice lattice(33, rng);
  tfx::TetraPlan plan;
  plan.Prepare(lattice.Table());
  // The colours' rows are unpadded, so that the whole image is one row.
  const CxImage& colours = tfx_test::EveryColour();
  ASSERT_EQ(colours.GetEffWidth(), colours.GetWidth() * 4);
  const int pixels = static_cast<int>(colours.GetWidth() * colours.GetHeight());
  const tfx_test::Image expected = tfx_test::Clone(colours);
  tfx::TetraRowReference(lattice.Table(), expected->GetBits(), pixels, 4);
  ForEveryTarget([&] {
    const tfx_test::Image actual = tfx_test::Clone(colours);
    tfx::TetraRow(plan, actual->GetBits(), actual->GetBits(), pixels, 4);
    EXPECT_TRUE(tfx_test::SameBuffer(*expected, *actual));
  });
}

// A caller resamples with the interpolation doLUT applies: at 18 points (cells of exactly 15
// levels) every byte position gives doLUT's bytes; positions outside are clamped onto the lattice.
TEST(CubeLutApply, InterpolationOfAnySizeMatchesTheReference) {
  constexpr int n = 18;
  std::mt19937 rng(18);
  Lattice lattice(n, rng);
  std::vector<float> dense;  // the n^3 points without the lattice's 64-point strides
  for (int p = 0; p < n * n; ++p) {
    dense.insert(dense.end(), lattice.Point(p / n, p % n, 0),
                 lattice.Point(p / n, p % n, 0) + 3 * n);
  }
  const tfx::TetraTable table = lattice.Table();
  for (int r = 0; r < 256; r += 3) {
    for (int g = 1; g < 256; g += 3) {
      for (int b = 2; b < 256; b += 3) {
        uint8_t pixel[3] = {uint8_t(b), uint8_t(g), uint8_t(r)};
        tfx::TetraRowReference(table, pixel, 1, 3);
        float out[3];
        CubeLut::interpolate(dense.data(), n, r / 15.0f, g / 15.0f, b / 15.0f, out);
        for (int c = 0; c < 3; ++c) {
          ASSERT_EQ(tfx::LutComponentToByte(out[c]), pixel[2 - c]) << r << " " << g << " " << b;
        }
      }
    }
  }
  float out[3];
  CubeLut::interpolate(dense.data(), n, -5.0f, std::numeric_limits<float>::quiet_NaN(), 99.0f, out);
  for (int c = 0; c < 3; ++c) EXPECT_EQ(out[c], lattice.Point(0, 0, n - 1)[c]);
}

}  // namespace
