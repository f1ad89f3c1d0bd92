#include "tessarofx/DetailFilters.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <functional>
#include <memory>
#include <vector>

#include "support/EveryTarget.h"
#include "support/ImageBuilders.h"
#include "tessarofx/Blur.h"

namespace {

using tfx_test::Image;
using tfx_test::NoiseImage;

using Pixels = std::vector<uint8_t>;

uint8_t ToByte(float v) { return v < 0.0f ? 0 : uint8_t(int(std::min(v, 255.0f))); }

// The image's rows without their padding, and back.
Pixels Packed(const CxImage& image) {
  const size_t row = size_t(image.GetWidth()) * image.GetBpp() / 8;
  Pixels p(row * image.GetHeight());
  for (size_t y = 0; y < image.GetHeight(); ++y) {
    std::memcpy(&p[y * row], image.GetBits() + y * image.GetEffWidth(), row);
  }
  return p;
}

Pixels Unpacked(const CxImage& image, const Pixels& p) {
  const size_t row = size_t(image.GetWidth()) * image.GetBpp() / 8;
  Pixels all(image.GetBits(), image.GetBits() + image.GetSize());
  for (size_t y = 0; y < image.GetHeight(); ++y) {
    std::memcpy(&all[y * image.GetEffWidth()], &p[y * row], row);
  }
  return all;
}

// Every colour byte (not a fourth byte) through fn(index).
template <class Fn>
Pixels MapColour(Pixels p, int ch, Fn fn) {
  for (size_t i = 0; i < p.size(); ++i) {
    if (i % size_t(ch) < 3) p[i] = fn(i);
  }
  return p;
}

// Each reference takes the packed pixels, width, height, bytes per pixel and strength.
Pixels RefDehaze(const Pixels& src, int w, int h, int ch, float s) {
  const float t = s / 100;
  if (s < 0) {
    // The formula, with its row term y / h (integer division), and the promise that adding
    // haze never darkens.
    return MapColour(src, ch, [&](size_t i) {
      const float tRow = float(int(i / size_t(ch)) / w / h) + t;
      return std::max(src[i], ToByte((src[i] - 255 * tRow) / (1 - tRow)));
    });
  }
  const size_t n = size_t(w) * size_t(h);
  Pixels M(n), Mave(n);
  int maxRGB = 0;
  uint64_t sum = 0;
  for (size_t i = 0; i < n; ++i) {
    const uint8_t* p = &src[i * size_t(ch)];
    M[i] = std::min({p[0], p[1], p[2]});
    maxRGB = std::max<int>(maxRGB, std::max({p[0], p[1], p[2]}));
    sum += M[i];
  }
  fastWindowAverageFilter(M.data(), Mave.data(), w, h, 7);
  const float k = std::min(t * 1.6f * float(sum / n) / 255, 0.9f);
  const float A = 0.5f * float(*std::max_element(Mave.begin(), Mave.end()) + maxRGB);
  return MapColour(src, ch, [&](size_t i) {
    const size_t p = i / size_t(ch);
    const int L = std::min<int>(M[p], uint8_t(int(Mave[p] * k)));
    return ToByte((src[i] - L) / (1 - L / A));
  });
}

Pixels RefSharpen(const Pixels& src, int w, int h, int ch, float a) {
  if (ch != 4 || w < 3 || h < 3) return src;
  Pixels out = src;
  for (int y = 1; y < h - 1; ++y) {
    for (int x = 1; x < w - 1; ++x) {
      for (int j = 0; j < 3; ++j) {
        const int i = y * w * 4 + (x - 1) * 4 + j;  // the copy, one pixel to the left
        const int lap = 4 * src[i] - src[i - w * 4] - src[i - 4] - src[i + 4] - src[i + w * 4];
        const float v = std::trunc(src[i] + lap * (a / 255));
        out[size_t(y * w * 4 + x * 4 + j)] = uint8_t(std::clamp(v, 0.0f, 255.0f));
      }
    }
  }
  return out;
}

// gaussianBlur at the stride it expects, rows rounded up to 4 bytes.
void Blur(Pixels& p, int w, int h, int ch, int radius) {
  const size_t row = size_t(w * ch), stride = (row + 3) & ~size_t{3};
  Pixels padded(stride * size_t(h));
  for (size_t y = 0; y < size_t(h); ++y) std::memcpy(&padded[y * stride], &p[y * row], row);
  gaussianBlur(padded.data(), w, h, ch, radius);
  for (size_t y = 0; y < size_t(h); ++y) std::memcpy(&p[y * row], &padded[y * stride], row);
}

Pixels RefClarity(const Pixels& src, int w, int h, int ch, float a) {
  Pixels blurred = src;
  if (std::fabs(a) > 2 && std::fabs(a) < 254) Blur(blurred, w, h, ch, a > 0 ? int(0.5f * a) : 2);
  return MapColour(src, ch,
                   [&](size_t i) { return ToByte(src[i] + (src[i] - blurred[i]) * (a / 200)); });
}

Pixels RefDiffuse(const Pixels& src, int w, int h, int ch, float a) {
  const double pi = 3.14159265358979323846;
  const float gain = float(std::fabs(std::cos(-pi * a / 1440 + pi / 2)) + 1);
  Pixels out = MapColour(src, ch, [&](size_t i) { return ToByte(src[i] * gain); });
  if (a > 0) Blur(out, w, h, ch, 1);
  return out;
}

// addNoiseFilter with a factor of 80.
Pixels RefNoise(const Pixels& src, int, int, int ch, float a) {
  uint32_t next = 0;
  const auto rand = [&] {
    next = next * 1103515245 + 12345;
    return int((next / 65536) % 32768);
  };
  const float s = (a / 100) * (80.0f / 100);
  Pixels out = src;
  for (size_t p = 0; p < out.size(); p += size_t(ch)) {
    rand();
    int sum = rand();
    for (int k = 0; k < 3; ++k) sum += rand();
    const float n = float(sum * 5.28596089837e-05 - 3.46410161514);
    for (size_t j = 0; j < 3; ++j) out[p + j] = ToByte(src[p + j] + n * s * 127);
  }
  return out;
}

// Noise squeezed into 64..191, so that no filter clips most of it, but for one white pixel:
// adding haze at some strengths, -99.9 among them, rounds white to just below itself in float.
Image MidNoise(unsigned w, unsigned h, unsigned bpp, unsigned padding) {
  Image image = NoiseImage(w, h, bpp, bpp == 24 ? IPF_BGR : IPF_BGRA, w * bpp / 8 + padding, 5);
  uint8_t* bits = image->GetBits();
  for (uint32_t i = 0; i < image->GetSize(); ++i) bits[i] = i < 3 ? 255 : 64 + bits[i] / 2;
  return image;
}

struct Named {
  const char* name;
  std::function<CxImage*(CxImage*, float)> filter;
  Pixels (*ref)(const Pixels&, int, int, int, float);
  std::vector<float> strengths;  // both signs, clipping, and each one's thresholds
  bool large;                    // also on 128 x 24 pixels
};

const Named kFilters[] = {
    {"dehaze", dehaze, RefDehaze, {30, 100, 250, -30, -99.9f, -100, -1000}, true},
    {"sharpen", sharpen, RefSharpen, {255, 30, -80, 1e30f}, false},
    {"clarity", clarity, RefClarity, {2.5f, 40, -40, 253, -3}, false},
    {"diffuse", diffuse, RefDiffuse, {90, -300, 720, 1440, 5000}, false},
    {"addNoiseFilter",
     [](CxImage* i, float a) { return addNoiseFilter(i, a, 80.0f); },
     RefNoise,
     {60, -45},
     true},
};

TEST(DetailFilters, MatchTheirDefinitionsOnEveryTarget) {
  // Vector bodies and tails; 128 x 24 carries the grain generator across batches of pixels and
  // gives dehaze's divisions enough pixels to show a rounding that differs. Padded rows are
  // walked one by one: their pixels are those of the packed rows, and the padding stays.
  const unsigned sizes[][3] = {{3, 3, 0}, {5, 4, 3}, {37, 11, 0}, {20, 17, 7}, {128, 24, 0}};
  tfx_test::ForEveryTarget([&] {
    for (const Named& f : kFilters) {
      for (const float s : f.strengths) {
        for (const auto& size : sizes) {
          if (size[0] == 128 && !f.large) continue;
          for (const unsigned bpp : {24u, 32u}) {
            SCOPED_TRACE(testing::Message() << f.name << ' ' << s << ' ' << size[0] << 'x'
                                            << size[1] << '+' << size[2] << " bpp " << bpp);
            Image image = MidNoise(size[0], size[1], bpp, size[2]);
            const Pixels expected = Unpacked(
                *image, f.ref(Packed(*image), int(size[0]), int(size[1]), int(bpp / 8), s));
            f.filter(image.get(), s);
            ASSERT_EQ(Pixels(image->GetBits(), image->GetBits() + image->GetSize()), expected);
          }
        }
      }
    }
  });
}

TEST(Dehaze, PlanesHoldTheDarkChannelAndTheHazeLevel) {
  // Pixels (B, G, R, A): alpha never counts.
  std::vector<uint8_t> px = {10, 20, 30, 255, 200, 90, 120, 0, 5, 5, 5, 9, 70, 60, 80, 1};
  uint8_t* bits = px.data();
  CxImage image(&bits, 2, 2, 32, 8, IPF_BGRA);
  uint32_t maxRGB = 0, maxDark = 0;
  std::unique_ptr<uint8_t[]> dark(getMinDarkChannel(&image, &maxRGB, &maxDark));
  ASSERT_NE(dark, nullptr);
  EXPECT_EQ(Pixels(dark.get(), dark.get() + 4), (Pixels{10, 90, 5, 60}));
  EXPECT_EQ(maxRGB, 200u);
  EXPECT_EQ(maxDark, 90u);
  dark.reset(getMinDarkChannel(&image, nullptr, nullptr));  // the out-values are optional
  EXPECT_NE(dark, nullptr);
  EXPECT_EQ(getMinDarkChannel(nullptr, &maxRGB, &maxDark), nullptr);
  EXPECT_EQ(maxRGB + maxDark, 0u);

  const uint8_t d[] = {100, 100, 100, 0, 255, 7}, mean[] = {50, 200, 255, 255, 255, 1};
  std::unique_ptr<uint8_t[]> L(calL(d, mean, 3, 2, 0.9f));
  ASSERT_NE(L, nullptr);
  // 0.9 * 255 = 229.5 truncates to 229, 0.9 * 1 to 0.
  EXPECT_EQ(Pixels(L.get(), L.get() + 6), (Pixels{45, 100, 100, 0, 229, 0}));
  // The product keeps its low byte: 255 * 1.2 = 306 -> 50; -255 -> 1.
  L.reset(calL(d, mean, 3, 2, 1.2f));
  EXPECT_EQ(L[4], 50);
  L.reset(calL(d, mean, 3, 2, -1.0f));
  EXPECT_EQ(L[4], 1);
  EXPECT_EQ(calL(nullptr, mean, 3, 2, 1.0f), nullptr);
  EXPECT_EQ(calL(d, nullptr, 3, 2, 1.0f), nullptr);
  EXPECT_EQ(calL(d, mean, 0, 2, 1.0f), nullptr);
  EXPECT_EQ(calL(d, mean, 3, -2, 1.0f), nullptr);
  EXPECT_EQ(calL(d, mean, 65536, 65536, 1.0f), nullptr);  // above INT_MAX bytes: nothing read
}

}  // namespace
