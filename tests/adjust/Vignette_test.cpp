#include "tessarofx/Vignette.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <vector>

#include "adjust/VignetteRows.h"
#include "support/EveryTarget.h"
#include "support/ImageBuilders.h"

namespace {

// The mask straight from its definition, pixel by pixel over the whole frame.
std::vector<float> ReferenceMask(int width, int height, float F, float S, float R) {
  const float cx = float(width >> 1), cy = float(height >> 1);
  float A = cx * 0.2f * (4.0f * S + 1.0f), B = cy * 0.2f * (4.0f * S + 1.0f);
  if (R >= 0.0f) {
    const float d = std::fabs(A - B) * R;
    if (A > B) {
      A -= d;
    } else if (B > A) {
      B -= d;
    }
  }
  const float W = std::max(A, B) * 0.5f * F + 3.0f, A2 = A + W, B2 = B + W;
  std::vector<float> mask(size_t(width) * size_t(height));
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      const float dx = std::fabs(float(x) - cx), dy = std::fabs(float(y) - cy);
      float value = 0.0f;
      if ((dx / A) * (dx / A) + (dy / B) * (dy / B) - 1.0f <= 0.0f) {
        value = 1.0f;
      } else if ((dx / A2) * (dx / A2) + (dy / B2) * (dy / B2) - 1.0f < 0.0f) {
        const float t = (dy / (dx + 0.000001f)) * (dy / (dx + 0.000001f));
        const float q = 1.0f / (t / (B2 * B2) + 1.0f / (A2 * A2));
        const float edge = std::sqrt(t * q + q);
        const float dist =
            std::sqrt((cx - float(x)) * (cx - float(x)) + (cy - float(y)) * (cy - float(y)));
        value = float((std::cos(double((W - (edge - dist)) * (3.1415927f / W))) + 1.0) * 0.5);
      }
      mask[size_t(y) * size_t(width) + size_t(x)] = value;
    }
  }
  return mask;
}

// The blend straight from its definition.
tagRGBQUAD ReferencePixel(tagRGBQUAD c, float g, float a, float e, float b) {
  const float gain = (1.0f + a) * (1.0f - g) + e * g;
  float ch[3] = {c.rgbRed * gain, c.rgbGreen * gain, c.rgbBlue * gain};
  if (g < 1.0f) {
    const float w =
        (1.0f - (ch[0] + ch[1] + ch[2]) / 3.0f / 255.0f) * ((1.0f - g) * (1.0f - g)) * b;
    for (float& v : ch) v = 255.0f - (255.0f - v) * (255.0f - w * v) / 255.0f;
  }
  uint8_t out[3];
  for (int i = 0; i < 3; ++i) out[i] = ch[i] < 0.0f ? 0 : uint8_t(int(std::min(255.0f, ch[i])));
  return tagRGBQUAD{out[2], out[1], out[0], c.rgbReserved};
}

struct Setting {
  float amount, feather, highlights, size, roundness, exposure;
};

// Both signs of amount and exposure, the curve on and off (highlights 50 makes b = 0), the
// extremes of every control, and roundness on either side of 0.
const Setting kSettings[] = {
    {-60, 50, 50, 100, 0, 0},      {45, 30, 80, 40, 30, -70}, {-100, 100, 0, 0, 100, 35},
    {100, 0, 100, 100, -50, -100}, {0, 70, 20, 60, 10, 25},   {-25, 50, 65, 75, 250, 150},
};

TEST(VignetteGradient, MatchesTheDefinitionOnEveryPixel) {
  // Odd and even sizes put the centre on or off the middle; tiny frames make A or B zero. At
  // 200 x 100, size 0 and full roundness, pixels lie exactly on the inner ellipse, which is in.
  const int sizes[][2] = {{1, 1},    {2, 3},  {17, 9},  {64, 48},
                          {101, 37}, {40, 1}, {9, 120}, {200, 100}};
  for (const auto& size : sizes) {
    for (const Setting& s : kSettings) {
      SCOPED_TRACE(testing::Message() << size[0] << 'x' << size[1] << " size " << s.size
                                      << " feather " << s.feather << " round " << s.roundness);
      const std::vector<float> expected =
          ReferenceMask(size[0], size[1], s.feather / 100, s.size / 100, s.roundness / 100);
      std::vector<float> actual(expected.size(), -1.0f);
      generateGradient(size[0], size[1], s.feather / 100, s.size / 100, s.roundness / 100,
                       actual.data());
      ASSERT_EQ(0, std::memcmp(expected.data(), actual.data(), expected.size() * 4));
    }
  }
  generateGradient(200, 100, 0.5f, 0.0f, 1.0f, nullptr);  // a null mask is ignored
  // So is a mask above INT_MAX bytes.
  std::vector<float> mask(16, -1.0f);
  generateGradient(65536, 8192, 0.5f, 1.0f, 0.0f, mask.data());
  EXPECT_EQ(mask, std::vector<float>(16, -1.0f));
}

TEST(VignetteRow, MatchesThePixelFormOnEveryColour) {
  // g = 1 takes a table, g = 0 another where b = 0 (highlights 50); everything else, g = 0 with
  // a tone curve included, goes through the blended blocks.
  const float darken = 1.0f, under = std::pow(2.0f, -0.7f), over = std::pow(2.0f, 0.35f);
  const struct {
    float a, e, b, g;
  } cases[] = {{-0.6f, darken, 0.0f, 0.0f},  {-0.6f, darken, 0.0f, 1.0f},
               {-0.6f, darken, 0.0f, 0.5f},  {-0.45f, under, 0.27f, 0.0f},
               {-0.45f, under, 0.27f, 1.0f}, {-0.45f, under, 0.27f, 0.99999994f},
               {0.8f, over, -0.8f, 0.0f},    {0.8f, over, -0.8f, 0.0173f}};
  const CxImage& every = tfx_test::EveryColour();
  const std::vector<uint8_t> all(every.GetBits(), every.GetBits() + every.GetSize());
  for (const auto& p : cases) {
    SCOPED_TRACE(testing::Message() << "a " << p.a << " b " << p.b << " g " << p.g);
    std::vector<uint8_t> expected = all;
    for (size_t i = 0; i < all.size(); i += 4) {
      tagRGBQUAD in;
      std::memcpy(&in, &all[i], 4);
      const tagRGBQUAD out = vignettePixel(in, p.g, p.a, p.e, p.b);
      std::memcpy(&expected[i], &out, 4);
      // The pixel form against the definition, on a sample of the colours.
      const tagRGBQUAD ref = i % 64 ? out : ReferencePixel(in, p.g, p.a, p.e, p.b);
      ASSERT_EQ(std::memcmp(&out, &ref, 4), 0) << "colour " << i / 4;
    }
    const std::vector<float> weights(4096, p.g);
    tfx_test::ForEveryTarget([&] {
      const tfx::VignetteBlend blend = tfx::MakeVignetteBlend(p.a, p.e, p.b);
      ASSERT_EQ(blend.outsideByTable, p.b == 0.0f);
      std::vector<uint8_t> actual = all;
      for (size_t i = 0; i < actual.size() / 4; i += 4096) {
        const size_t n = std::min<size_t>(4096, actual.size() / 4 - i);
        tfx::VignetteRow(actual.data() + 4 * i, weights.data(), n, blend);
      }
      const auto diff = std::mismatch(expected.begin(), expected.end(), actual.begin()).first;
      ASSERT_TRUE(diff == expected.end()) << "byte " << diff - expected.begin();
    });
  }
}

// The image function against the exported pieces, pixel by pixel through the accessors.
void ReferenceFilter(CxImage* image, const Setting& s) {
  if (s.amount == 0.0f && s.exposure == 0.0f) return;
  const int w = int(image->GetWidth()), h = int(image->GetHeight());
  std::vector<float> mask(size_t(w) * size_t(h));
  generateGradient(w, h, s.feather / 100.0f, s.size / 100.0f, s.roundness / 100.0f, mask.data());
  const float e = std::pow(2.0f, s.exposure / 100.0f);
  const float a = s.amount / 100.0f;
  const float b = std::fabs(a) * (2.0f * s.highlights / 100.0f - 1.0f);
  size_t i = 0;
  tfx_test::MapPixels(image, [&](tagRGBQUAD c) { return vignettePixel(c, mask[i++], a, e, b); });
}

TEST(Vignette, MatchesMaskAndPixelFormOnEveryLayout) {
  const struct {
    unsigned width, height, bpp, effWidth;
    _ImagePixelFormat format;
  } layouts[] = {{1, 1, 32, 4, IPF_BGRA},     {2, 3, 32, 8, IPF_BGRA},
                 {67, 41, 32, 280, IPF_BGRA}, {130, 77, 32, 520, IPF_BGRA},
                 {64, 48, 32, 256, IPF_RGBA}, {33, 20, 24, 100, IPF_BGR},
                 {21, 13, 8, 24, IPF_Gray8}};
  for (const auto& l : layouts) {
    for (const Setting& s : kSettings) {
      SCOPED_TRACE(testing::Message() << l.width << 'x' << l.height << '/' << l.bpp << " amount "
                                      << s.amount << " exposure " << s.exposure);
      ASSERT_TRUE(tfx_test::SameResult(
          *tfx_test::NoiseImage(l.width, l.height, l.bpp, l.format, l.effWidth, l.width),
          [&](CxImage* i) {
            EXPECT_EQ(vignetteAdjustFilter(i, s.amount, s.feather, s.highlights, s.size,
                                           s.roundness, s.exposure),
                      i);
          },
          [&](CxImage* i) { ReferenceFilter(i, s); }));
    }
  }
}

}  // namespace
