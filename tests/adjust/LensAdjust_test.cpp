#include "tessarofx/LensAdjust.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <random>
#include <vector>

#include "adjust/LensMaps.h"
#include "simd/lens_resample.h"
#include "support/EveryTarget.h"
#include "support/ImageBuilders.h"

namespace {

using tfx_test::Image;
using tfx_test::NoiseImage;
using tfx_test::SameBuffer;
using tfx_test::SameResult;
using Map = std::vector<tfx::LensPoint>;

// The maps straight from their definitions, pixel by pixel.
Map ReferenceDistortMap(float d, int w, int h) {
  const float k = d / 100.0f, cx = float(w >> 1), cy = float(h >> 1);
  const float diagonal = std::sqrt(cx * cx + cy * cy);
  const float nx = k < 0.0f ? float(w) : diagonal, ny = k < 0.0f ? float(h) : diagonal;
  const double e = k > 0.0f ? 3.0 : 6.0;
  Map map;
  for (int y = 0; y < h; ++y) {
    for (int x = 0; x < w; ++x) {
      const float u = (float(x) - cx) / nx, v = (float(y) - cy) / ny;
      const float r = std::sqrt(u * u + v * v);
      const float c = r == 0.0f ? 0.0f : u / r, s = r == 0.0f ? 0.0f : v / r;
      const float rp =
          (float(std::pow(double(r), e)) * k + r) * (k >= 0.0f ? 1.0f / (k + 1.0f) : 1.0f);
      map.push_back({int16_t(int(c * rp * nx + cx)), int16_t(int(s * rp * ny + cy))});
    }
  }
  return map;
}

// Blue, green, red.
std::vector<Map> ReferenceFringingMaps(float f, int w, int h) {
  const float k = f / 100.0f, cx = float(w >> 1), cy = float(h >> 1);
  const double s = 1 + 0.03 * k, t = 1 - 0.03 * k, m = k > 0.0f ? 2.0 : 1.0;
  const auto clamp = [](double v, double hi) {
    return int16_t(int(std::max(0.0, std::min(v, hi))));
  };
  std::vector<Map> maps(3);
  for (int y = 0; y < h; ++y) {
    for (int x = 0; x < w; ++x) {
      const float u = (float(x) - cx) / float(w), v = (float(y) - cy) / float(h);
      const float r = std::sqrt(u * u + v * v);
      const float c = r == 0.0f ? 0.0f : u / r, sn = r == 0.0f ? 0.0f : v / r;
      const double R = (std::pow(double(r), 10.0) * k + r) * s;
      maps[0].push_back({clamp(t * c * R * w + cx, w - m), clamp(t * sn * R * h + cy, h - m)});
      maps[1].push_back({clamp(c * R * w + cx, w - m), clamp(sn * R * h + cy, h - m)});
      maps[2].push_back({clamp(s * c * R * w + cx, w - m), clamp(s * sn * R * h + cy, h - m)});
    }
  }
  return maps;
}

// width * height pixels from the first byte; the horizontal source is a byte offset.
void ReferenceDistort(CxImage* image, const Map& map) {
  const size_t bytes = image->GetBpp() / 8, row = image->GetWidth() * bytes;
  const std::vector<uint8_t> copy(image->GetBits(), image->GetBits() + image->GetSize());
  for (size_t i = 0; i < map.size(); ++i) {
    const int64_t pos = int64_t(map[i].y) * int64_t(row) + map[i].x;
    if (pos < 0 || size_t(pos) + bytes > copy.size()) continue;
    std::memcpy(image->GetBits() + i * bytes, &copy[size_t(pos)], bytes);
  }
}

void ReferenceFringing(CxImage* image, const std::vector<Map>& maps) {
  CxImage copy;
  copy.Copy(*image);
  for (unsigned y = 0, i = 0; y < image->GetHeight(); ++y) {
    for (unsigned x = 0; x < image->GetWidth(); ++x, ++i) {
      const auto at = [&](int plane) {
        return copy.GetPixelColor(maps[plane][i].x, maps[plane][i].y, true);
      };
      const tagRGBQUAD g = at(1);
      image->SetPixelColor(x, y, {at(0).rgbBlue, g.rgbGreen, at(2).rgbRed, g.rgbReserved});
    }
  }
}

TEST(Lens, ResamplesLikeTheDefinitionsOnEveryLayout) {
  // Distortion walks packed pixels, fringing honours the stride; odd and even sizes put the
  // centre on or off the middle. -2000 sends sources outside the buffer, where nothing may be
  // read; past 32767 pixels coordinates wrap negative. Beyond +-100 fringing clamps to the frame.
  const struct {
    unsigned width, height, bpp, effWidth;
    _ImagePixelFormat format;
  } layouts[] = {
      {64, 48, 32, 256, IPF_BGRA},  {67, 41, 32, 300, IPF_BGRA},     {40, 30, 32, 160, IPF_RGBA},
      {33, 20, 24, 100, IPF_BGR},   {21, 13, 8, 24, IPF_Gray8},      {3, 2, 32, 12, IPF_BGRA},
      {1, 1, 32, 4, IPF_BGRA},      {2, 2, 32, 8, IPF_BGRA},         {17, 9, 32, 68, IPF_BGRA},
      {101, 37, 32, 404, IPF_BGRA}, {32800, 2, 32, 131200, IPF_BGRA}};
  for (const auto& l : layouts) {
    const int w = int(l.width), h = int(l.height);
    for (const float s : {-2000.0f, -100.0f, -37.5f, 15.0f, 45.0f, 100.0f, 180.0f, 400.0f}) {
      SCOPED_TRACE(testing::Message() << w << 'x' << h << '/' << l.bpp << " strength " << s);
      const Image original = NoiseImage(l.width, l.height, l.bpp, l.format, l.effWidth, l.width);
      ASSERT_TRUE(SameResult(
          *original, [&](CxImage* i) { EXPECT_EQ(distortFilter(i, s), i); },
          [&](CxImage* i) { ReferenceDistort(i, ReferenceDistortMap(s, w, h)); }));
      ASSERT_TRUE(SameResult(
          *original, [&](CxImage* i) { EXPECT_EQ(fringingFilter(i, s), i); },
          [&](CxImage* i) { ReferenceFringing(i, ReferenceFringingMaps(s, w, h)); }));
    }
  }
}

TEST(LensCache, ReusesMapsUntilStrengthSizeOrReleaseChanges) {
  releaseLensVariables();
  const uint64_t start = tfx::LensMapBuilds();
  const auto builds = [&] { return tfx::LensMapBuilds() - start; };

  // Zero strengths and empty images build nothing.
  const Image image = NoiseImage(40, 30, 32, IPF_BGRA, 160, 3);
  CxImage empty;
  distortFilter(image.get(), 0.0f);
  fringingFilter(image.get(), 0.0f);
  distortFilter(&empty, 10.0f);
  EXPECT_EQ(builds(), 0u);

  const auto first = tfx::DistortMaps(10.0f, 40, 30);
  distortFilter(image.get(), 10.0f);
  EXPECT_EQ(tfx::DistortMaps(10.0f, 40, 30), first);
  EXPECT_EQ(builds(), 1u);
  const auto changed = tfx::DistortMaps(10.5f, 40, 30);
  EXPECT_NE(changed, first);
  EXPECT_NE(tfx::DistortMaps(10.5f, 41, 30), changed);
  EXPECT_EQ(builds(), 3u);

  // Two sets are kept: the most recently used survives a third setting, the other goes.
  EXPECT_EQ(tfx::DistortMaps(10.5f, 40, 30), changed);
  EXPECT_EQ(builds(), 3u);
  tfx::DistortMaps(20.0f, 40, 30);
  EXPECT_EQ(tfx::DistortMaps(10.5f, 40, 30), changed);
  EXPECT_EQ(builds(), 4u);

  const auto fringing = tfx::FringingMaps(10.0f, 40, 30);
  EXPECT_EQ(tfx::FringingMaps(10.0f, 40, 30), fringing);
  EXPECT_EQ(builds(), 5u);

  // After a release every setting is rebuilt; maps still held stay readable.
  releaseLensVariables();
  EXPECT_NE(tfx::DistortMaps(10.5f, 40, 30), changed);
  EXPECT_NE(tfx::FringingMaps(10.0f, 40, 30), fringing);
  EXPECT_EQ(builds(), 7u);
  EXPECT_EQ(changed->plane[0][0].x, ReferenceDistortMap(10.5f, 40, 30)[0].x);
}

TEST(LensComposite, OnePassGivesTheTwoStepsOnEveryTarget) {
  // -2000 sends sources outside the buffer (the pixel stays); 150 with 100 needs both coded and
  // spilled blocks.
  const struct {
    int w, h;
    float d, f;
  } cases[] = {{64, 48, 40, 60},
               {101, 37, -30, -80},
               {50, 30, -2000, 30},
               {3, 2, 250, 400},
               {67, 23, 150, 100}};
  tfx_test::ForEveryTarget([&] {
    size_t coded = 0, spilled = 0;
    for (const auto& c : cases) {
      SCOPED_TRACE(testing::Message() << c.w << 'x' << c.h << " " << c.d << " " << c.f);
      const Image source = NoiseImage(c.w, c.h, 32, IPF_BGRA, c.w * 4, c.w);
      const Image distorted = NoiseImage(c.w, c.h, 32, IPF_BGRA, c.w * 4, 1);
      const Image expected = NoiseImage(c.w, c.h, 32, IPF_BGRA, c.w * 4, 2);
      const Image actual = NoiseImage(c.w, c.h, 32, IPF_BGRA, c.w * 4, 3);
      ASSERT_TRUE(tfx::DistortFrom(*source, distorted.get(), c.d));
      ASSERT_TRUE(tfx::FringeFrom(*distorted, expected.get(), c.f));
      tfx::LensComposite composite;
      ASSERT_TRUE(tfx::ComposeLens(c.d, c.f, c.w, c.h, &composite));
      for (int b = 0; b < (c.w * c.h + 15) / 16; ++b) {
        composite.blocks[size_t(b)].spill < 0 ? ++coded : ++spilled;
      }
      ASSERT_TRUE(tfx::DistortFringeFrom(*source, actual.get(), composite));
      EXPECT_TRUE(SameBuffer(*expected, *actual));
      // Other layouts are refused untouched.
      const Image padded = NoiseImage(c.w, c.h, 32, IPF_BGRA, c.w * 4 + 4, 4);
      const Image untouched = tfx_test::Clone(*padded);
      EXPECT_FALSE(tfx::DistortFringeFrom(*source, padded.get(), composite));
      EXPECT_TRUE(SameBuffer(*untouched, *padded));
    }
    EXPECT_TRUE(coded > 0 && spilled > 0) << coded << " coded, " << spilled << " spilled";
  });
  tfx::LensComposite none;
  EXPECT_FALSE(tfx::ComposeLens(10, 0, 64, 48, &none));
  EXPECT_FALSE(tfx::ComposeLens(10, 10, 9000, 2, &none));
}

// The image functions run the best kernel set only; every set against the per-point forms, on
// rows with a partial last vector, sources outside the buffer, and offsets that overflow int or
// are NaN.
TEST(LensResampleRows, EverySetMatchesThePerPointForms) {
  const int w = 67, h = 23, n = w * h, srcSize = n * 4, stride = w * 4 + 12;
  std::mt19937 rng(5);
  const auto uniform = [&](int lo, int hi) {
    return std::uniform_int_distribution<int>(lo, hi)(rng);
  };
  const std::vector<uint8_t> src = tfx_test::NoiseBytes(size_t(n) * 4 + 12 * h, 4);
  const auto word = [&](size_t offset) {
    uint32_t v;
    std::memcpy(&v, &src[offset], 4);
    return v;
  };
  // Blue from the first source, green and alpha from the second, red from the third.
  const auto mix = [](uint32_t b, uint32_t g, uint32_t r) {
    return (b & 0xffu) | (g & 0xff00ff00u) | (r & 0xff0000u);
  };
  Map wild(n), inside[3];
  std::vector<uint32_t> distorted(n), fringed(n);
  std::vector<int32_t> offsets[3];
  for (int i = 0; i < n; ++i) {
    wild[size_t(i)] = {int16_t(uniform(-400, 700)), int16_t(uniform(-3, h + 3))};
    const int pos = wild[size_t(i)].y * w * 4 + wild[size_t(i)].x;
    distorted[size_t(i)] = word(pos >= 0 && pos + 4 <= srcSize ? size_t(pos) : size_t(i) * 4);
    for (int p = 0; p < 3; ++p) {
      inside[p].push_back({int16_t(uniform(0, w - 1)), int16_t(uniform(0, h - 1))});
      offsets[p].push_back(inside[p].back().y * stride + inside[p].back().x * 4);
    }
    fringed[size_t(i)] = mix(word(size_t(offsets[0].back())), word(size_t(offsets[1].back())),
                             word(size_t(offsets[2].back())));
  }
  // Coded blocks: random windows of up to four rows, spilled blocks among them, and a partial
  // last block, which is always spilled.
  const size_t blockCount = (size_t(n) + 15) / 16;
  std::vector<tfx::LensBlock> blocks(blockCount);
  std::vector<int32_t> spill;
  std::vector<uint32_t> fromBlocks;
  for (size_t b = 0; b < blockCount; ++b) {
    tfx::LensBlock& block = blocks[b];
    int32_t coded[3][16];
    const bool spilled = b % 5 == 2 || b + 1 == blockCount;
    for (int p = 0; p < 3; ++p) {
      const int rowsUsed = uniform(0, 3);
      block.base[p] = uniform(0, srcSize - 64 - rowsUsed * w * 4);
      for (int l = 0; l < 16; ++l) {
        const int row = uniform(0, rowsUsed), byte = uniform(0, 60);
        block.index[p][l] = uint8_t(row << 6 | byte);
        coded[p][l] = spilled ? uniform(0, srcSize - 4) : block.base[p] + row * w * 4 + byte;
      }
    }
    block.spill = spilled ? int32_t(spill.size() / 48) : -1;
    if (spilled) spill.insert(spill.end(), &coded[0][0], &coded[0][0] + 48);
    for (int l = 0; l < 16; ++l) {
      fromBlocks.push_back(
          mix(word(size_t(coded[0][l])), word(size_t(coded[1][l])), word(size_t(coded[2][l]))));
    }
  }
  fromBlocks.resize(size_t(n));

  const int qw = w / 2 + 1;
  std::vector<float> basis[4], x(qw), y(qw);
  for (auto& plane : basis) {
    for (int i = 0; i < qw; ++i) plane.push_back(float(uniform(-4000, 4000)) / 7.0f);
  }
  const float special[] = {3e9f, -3e9f, std::numeric_limits<float>::quiet_NaN(), -0.0f};
  std::copy(special, special + 4, basis[1].begin() + 5);
  const float scale[4] = {0.3f, 1.0f / 1.3f, 37.1f, 37.1f};
  const auto truncated = [](float v) {
    return int16_t(uint16_t(v >= -2147483648.0f && v < 2147483648.0f ? int(v) : INT32_MIN));
  };

  tfx_test::ForEveryTarget([&] {
    const tfx::LensResampleRows& rows = tfx::BestLensResampleRows();
    std::vector<uint32_t> out(n);
    uint8_t* const bytes = reinterpret_cast<uint8_t*>(out.data());
    rows.distort(wild.data(), wild.size(), w * 4, src.data(), srcSize, bytes);
    EXPECT_EQ(out, distorted);
    for (int row = 0; row < h; ++row) {
      const size_t i0 = size_t(row) * w;
      rows.fringe(&inside[0][i0], &inside[1][i0], &inside[2][i0], size_t(w), src.data(), stride,
                  bytes + i0 * 4);
    }
    EXPECT_EQ(out, fringed);
    std::fill(out.begin(), out.end(), 0);
    rows.fringeOffsets(offsets[0].data(), offsets[1].data(), offsets[2].data(), size_t(n),
                       src.data(), bytes);
    EXPECT_EQ(out, fringed);
    rows.fringeBlocks(blocks.data(), out.size(), spill.data(), w * 4, src.data(), srcSize, bytes);
    EXPECT_EQ(out, fromBlocks);

    rows.distortOffsets(basis[0].data(), basis[1].data(), basis[2].data(), basis[3].data(),
                        size_t(qw), scale, x.data(), y.data());
    for (const bool above : {false, true}) {
      Map points(static_cast<size_t>(w));
      rows.assembleRow(x.data(), y.data(), above, w, w / 2, float(w / 2), 11.0f, points.data());
      for (int column = 0; column < w; ++column) {
        const size_t q = size_t(std::abs(column - w / 2));
        const float rp = (basis[1][q] * scale[0] + basis[0][q]) * scale[1];
        const float ox = basis[2][q] * rp * scale[2], oy = basis[3][q] * rp * scale[3];
        ASSERT_EQ(points[size_t(column)].x, truncated((column < w / 2 ? -ox : ox) + float(w / 2)))
            << column;
        ASSERT_EQ(points[size_t(column)].y, truncated((above ? -oy : oy) + 11.0f)) << column;
      }
    }
  });
}

}  // namespace
