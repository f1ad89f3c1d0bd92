#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <climits>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include "simd/dct8.h"
#include "simd/hsl_rows.h"
#include "support/EveryTarget.h"
#include "support/ImageBuilders.h"
#include "tessarofx/Blur.h"
#include "tessarofx/Denoise.h"

namespace {

using tfx_test::EveryColour;
using tfx_test::ForEveryTarget;
using tfx_test::Image;
using tfx_test::NoiseBytes;
using tfx_test::NoiseImage;

// The textbook 8-point transform in double, of 8 values `step` apart, in place.
void Textbook(double* v, bool inverse, int step = 1) {
  // c(k) cos((2n + 1) k pi / 16) at [k][n].
  const auto basis = [](int k, int n) {
    return (k == 0 ? std::sqrt(0.125) : 0.5) * std::cos((2 * n + 1) * k * 3.14159265358979 / 16);
  };
  double out[8] = {};
  for (int k = 0; k < 8; ++k) {
    for (int n = 0; n < 8; ++n) out[k] += (inverse ? basis(n, k) : basis(k, n)) * v[n * step];
  }
  for (int k = 0; k < 8; ++k) v[k * step] = out[k];
}

void Textbook2D(double* block, bool inverse, bool rows = true) {
  for (int r = 0; rows && r < 8; ++r) Textbook(block + 8 * r, inverse);
  for (int c = 0; c < 8; ++c) Textbook(block + c, inverse, 8);
}

TEST(DctTransform, MatchesTheTextbookTransformInPlaceAndOnEveryTarget) {
  const std::vector<uint8_t> bytes = NoiseBytes(64 * 8, 3);
  std::vector<float> input(bytes.begin(), bytes.end());
  for (size_t i = 0; i < input.size(); i += 3) input[i] = -input[i] * 7.5f;
  std::vector<float> firstTarget;
  ForEveryTarget([&] {
    std::vector<float> all;
    for (size_t b = 0; b < input.size(); b += 64) {
      const float* in = &input[b];
      // 1-D forward and inverse, 2-D forward and inverse, columns of row transforms, the
      // denoiser's scaled 1-D forward and inverse.
      for (int kind = 0; kind < 7; ++kind) {
        SCOPED_TRACE(kind);
        const bool inverse = kind % 2 == 1;
        const int n = kind < 2 || kind > 4 ? 8 : 64;
        double l1 = 0;
        for (int i = 0; i < n; ++i) l1 += std::abs(in[i]);
        std::vector<double> expected(in, in + 64);
        float out[64], inPlace[64];
        std::memcpy(inPlace, in, sizeof(inPlace));
        if (kind < 2) {
          Textbook(expected.data(), inverse);
          DCT8X81D(in, out, inverse);
          DCT8X81D(inPlace, inPlace, inverse);
        } else if (kind < 4) {
          Textbook2D(expected.data(), inverse);
          DCT8X82D(in, out, inverse);
          DCT8X82D(inPlace, inPlace, inverse);
        } else if (kind == 4) {
          Textbook2D(expected.data(), false, false);
          DCT8X82DR(in, out);
          DCT8X82DR(inPlace, inPlace);
        } else {
          for (int k = 0; inverse && k < 8; ++k) expected[k] *= 8 / tfx::DctForwardGain(k);
          Textbook(expected.data(), inverse);
          for (int k = 0; !inverse && k < 8; ++k) expected[k] *= tfx::DctForwardGain(k);
          tfx::Dct8Scaled(in, out, inverse);
          tfx::Dct8Scaled(inPlace, inPlace, inverse);
        }
        // 64 products of constants off by 4e-7 stay within 2e-6 of the L1 norm (times the scaled
        // forms' largest gain, 10.3); any wrong term is off by more.
        const double bound = (kind > 4 ? 10.3 : 1.0) * 2e-6 * l1;
        for (int i = 0; i < n; ++i) ASSERT_NEAR(expected[i], out[i], bound) << i;
        EXPECT_EQ(std::memcmp(out, inPlace, n * sizeof(float)), 0);
        all.insert(all.end(), out, out + n);
      }
    }
    if (firstTarget.empty()) firstTarget = all;
    EXPECT_EQ(std::memcmp(all.data(), firstTarget.data(), all.size() * sizeof(float)), 0);
  });
}

struct Plane {
  int width, height, stride;
  std::vector<uint8_t> bytes;
  uint8_t& at(int x, int y) { return bytes[size_t(y) * stride + x]; }
};

// Ramps that wrap every 216 levels with noise of about +-24 on them, so that coefficients spread
// around any threshold and the clamp to 0..255 is reached; row padding is noise.
Plane NoisyRamp(int width, int height, int stride, uint32_t salt) {
  Plane p{width, height, stride, NoiseBytes(size_t(stride) * height, salt)};
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      p.at(x, y) =
          static_cast<uint8_t>(std::clamp((4 * x + 2 * y) % 216 + p.at(x, y) / 5 - 24, 0, 255));
    }
  }
  return p;
}

std::vector<uint8_t> Denoised(const Plane& p, float sigma) {
  std::vector<uint8_t> out(p.bytes.size(), 0xA5);
  dct_Denosing(p.bytes.data(), out.data(), p.width, p.height, p.stride, sigma);
  return out;
}

// The denoiser's defined arithmetic, one scaled 8-point transform at a time; the order of the
// float additions (block rows, then block columns, each increasing) is part of the definition.
std::vector<uint8_t> Defined(const Plane& p, float sigma) {
  const int w = p.width, h = p.height, blockColumns = w - 8, blockRows = h - 8;
  float thresholds[64];
  tfx::DctScaledThresholds(3.0f * sigma, thresholds);
  std::vector<float> sum(size_t(w) * h, 0.0f), rows(size_t(h) * 8), strip(size_t(h) * 8);
  for (int x = 0; x < blockColumns; ++x) {
    for (int y = 0; y < h; ++y) {
      float in[8];
      for (int n = 0; n < 8; ++n) in[n] = p.bytes[size_t(y) * p.stride + x + n];
      tfx::Dct8Scaled(in, &rows[size_t(y) * 8], false);
    }
    std::fill(strip.begin(), strip.end(), 0.0f);
    for (int y = 0; y < blockRows; ++y) {
      for (int k = 0; k < 8; ++k) {
        float column[8];
        for (int i = 0; i < 8; ++i) column[i] = rows[size_t(y + i) * 8 + k];
        tfx::Dct8Scaled(column, column, false);
        for (int j = 0; j < 8; ++j)
          column[j] = std::abs(column[j]) < thresholds[8 * k + j] ? 0.0f : column[j];
        tfx::Dct8Scaled(column, column, true);
        for (int i = 0; i < 8; ++i) strip[size_t(y + i) * 8 + k] += column[i];
      }
    }
    for (int y = 0; y < blockRows; ++y) {
      float out[8];
      tfx::Dct8Scaled(&strip[size_t(y) * 8], out, true);
      for (int j = 0; j < 8; ++j) sum[size_t(y) * w + x + j] += out[j];
    }
  }
  std::vector<uint8_t> bytes = p.bytes;
  for (int y = 0; y < blockRows; ++y) {
    for (int x = 0; x < blockColumns; ++x) {
      const float weight = float(std::min(y, 7) + 1) * float(64 * (std::min(x, 7) + 1));
      const float mean = std::clamp(sum[size_t(y) * w + x] / weight, 0.0f, 255.0f);
      bytes[size_t(y) * p.stride + x] = static_cast<uint8_t>(mean);
    }
  }
  return bytes;
}

TEST(DctDenoise, FollowsTheDefinedArithmeticToTheBitOnEveryTarget) {
  // Widths across tiles and vector tails, heights around each vector length's group boundaries and
  // across bands, padded rows, planes smaller than a block. Sigma 0 keeps every block whole, so
  // truncation shows any change in the order of the float additions.
  std::vector<Plane> planes = {NoisyRamp(9, 9, 9, 61),        NoisyRamp(40, 23, 43, 62),
                               NoisyRamp(77, 31, 77, 63),     NoisyRamp(203, 57, 208, 64),
                               NoisyRamp(300, 20, 300, 65),   NoisyRamp(150, 300, 150, 66),
                               NoisyRamp(4200, 11, 4200, 67), NoisyRamp(8, 12, 8, 68),
                               NoisyRamp(16, 8, 19, 69),      NoisyRamp(1, 1, 1, 70)};
  for (int h = 9; h <= 44; ++h) planes.push_back(NoisyRamp(9 + h % 5, h, 9 + h % 5 + h % 2, h));
  for (const int h : {70, 96, 264, 530}) planes.push_back(NoisyRamp(h / 20 + 9, h, h / 20 + 12, h));
  ForEveryTarget([&] {
    for (const Plane& p : planes) {
      for (const float sigma : {0.0f, 4.0f, 15.0f}) {
        SCOPED_TRACE(std::to_string(p.width) + "x" + std::to_string(p.height) + ", sigma " +
                     std::to_string(sigma));
        const std::vector<uint8_t> expected = Defined(p, sigma);
        std::vector<uint8_t> inPlace = p.bytes;
        dct_Denosing(inPlace.data(), inPlace.data(), p.width, p.height, p.stride, sigma);
        ASSERT_EQ(inPlace, expected);
        // Padding stays as it was: the source's in place, the filler in another buffer.
        const std::vector<uint8_t> copy = Denoised(p, sigma);
        for (size_t i = 0; i < copy.size(); ++i) {
          ASSERT_EQ(copy[i], int(i % p.stride) >= p.width ? 0xA5 : expected[i]) << i;
        }
      }
    }
  });
}

TEST(DctDenoise, KeepsAFlatPlaneUnlessTheThresholdPassesItsDcTerm) {
  // A flat plane of v has only the DC term 8 v, carried exactly: kept up to the largest sigma with
  // 3 sigma <= 8 v in float, zeroed from the next.
  const int w = 20, h = 18;
  for (int v = 1; v < 256; ++v) {
    SCOPED_TRACE(v);
    const Plane p{w, h, w, std::vector<uint8_t>(size_t(w) * h, uint8_t(v))};
    float sigma = 8.0f * v / 3;
    while (3.0f * sigma > 8.0f * v) sigma = std::nextafter(sigma, 0.0f);
    while (3.0f * std::nextafter(sigma, 1e9f) <= 8.0f * v) sigma = std::nextafter(sigma, 1e9f);
    EXPECT_EQ(Denoised(p, sigma), p.bytes);
    const std::vector<uint8_t> out = Denoised(p, std::nextafter(sigma, 1e9f));
    for (size_t i = 0; i < out.size(); ++i) {
      ASSERT_EQ(out[i], int(i / w) < h - 8 && int(i % w) < w - 8 ? 0 : v) << i;
    }
  }
}

TEST(DctDenoise, LeavesBadInputAlone) {
  const Plane p = NoisyRamp(16, 12, 16, 31);
  std::vector<uint8_t> out(p.bytes.size(), 0xA5);
  const std::vector<uint8_t> filler = out;
  dct_Denosing(nullptr, out.data(), 16, 12, 16, 10.0f);
  dct_Denosing(p.bytes.data(), nullptr, 16, 12, 16, 10.0f);
  // Sizes below 1, strides below a row, and rows past INT_MAX bytes.
  for (const auto& [w, h, stride] :
       {std::array{0, 12, 16}, std::array{-3, 12, 16}, std::array{16, 0, 16},
        std::array{16, -1, 16}, std::array{16, 12, 15}, std::array{16, 12, -16},
        std::array{16, 3, INT_MAX / 2}}) {
    dct_Denosing(p.bytes.data(), out.data(), w, h, stride, 10.0f);
  }
  EXPECT_EQ(out, filler);
}

// 24-bit rows of width * 3 bytes, not padded to 4: recombining the planes would re-create the
// image with padded rows that the wrapped buffer cannot hold.
TEST(DeNoise, LeavesAWrappedImageItsRowsCannotBePaddedIn) {
  std::vector<uint8_t> pixels = NoiseBytes(15 * 12, 3);
  const std::vector<uint8_t> before = pixels;
  uint8_t* bits = pixels.data();
  CxImage image(&bits, 5, 12, 24, 15, IPF_BGR);
  for (auto* denoise : {deNoiseRGB, deNoiseLumiance}) {
    EXPECT_EQ(denoise(&image, 80.0f), &image);
    EXPECT_EQ(image.GetWidth(), 5u);
    EXPECT_EQ(image.GetEffWidth(), 15u);
    EXPECT_EQ(pixels, before);
  }
}

TEST(ChannelDenoise, PullsEachPixelTowardsItsWindowMean) {
  // Noise with flat patches: zero variance bytes come from flat windows and from noisy ones
  // whose variance wrapped.
  const int w = 61, h = 47;
  std::vector<uint8_t> source = NoiseBytes(w * h, 7);
  for (int i = 0; i < w * h; ++i) source[i] = (i % w / 8 + i / w / 8) % 3 ? source[i] : 90;
  const auto byte = [](double x) { return static_cast<int>(std::clamp(x, 0.0, 255.0)); };
  for (const int windowSize : {1, 3, 4, 7}) {
    std::vector<uint8_t> mean(w * h), variance(w * h);
    fastWindowAverageFilter(source.data(), mean.data(), w, h, (windowSize - 1) / 2);
    fastWindowVarianceFilter(source.data(), variance.data(), w, h, (windowSize - 1) / 2);
    EXPECT_NE(std::count(variance.begin(), variance.end(), 0), 0);
    for (const float noise : {0.0f, 0.5f, 40.0f, 1e6f}) {
      SCOPED_TRACE("window " + std::to_string(windowSize) + ", noise " + std::to_string(noise));
      std::vector<uint8_t> plane = source;
      channelDenoise(plane.data(), w, h, windowSize, noise);
      for (int i = 0; i < w * h; ++i) {
        const double v = variance[i], k = v / (v + noise);
        const double value = source[i] * k + mean[i] * (1 - k);
        if (v == 0) {
          ASSERT_EQ(plane[i], mean[i]) << i;  // whatever the noise, 0 included
        } else if (noise == 0.0f) {
          ASSERT_EQ(plane[i], source[i]) << i;
        } else {
          // Float rounding may put a value within 1e-4 of an integer on either side of it.
          ASSERT_TRUE(plane[i] == byte(value - 1e-4) || plane[i] == byte(value + 1e-4))
              << i << ": " << int(plane[i]) << " for " << value;
        }
      }
    }
  }
}

TEST(DctDenoise, FiltersThreeColourPlanesAndKeepsAlphaOnEveryTarget) {
  const float strength = 60.0f, sigma = static_cast<float>(strength * 0.15);
  const struct {
    unsigned bpp;
    _ImagePixelFormat format;
    bool hsl;
    unsigned w, h, extraStride;  // a wrapped stride beyond the padding is recombined without it
  } cases[] = {{32, IPF_BGRA, false, 27, 19, 0},  {24, IPF_RGB, false, 27, 19, 0},
               {32, IPF_RGBA, true, 27, 19, 0},   {24, IPF_BGR, true, 27, 19, 0},
               {32, IPF_BGRA, false, 150, 37, 0}, {24, IPF_RGB, true, 149, 30, 0},
               {32, IPF_BGRA, true, 150, 21, 0},  {24, IPF_BGR, false, 149, 22, 0},
               {32, IPF_RGBA, true, 30, 12, 8}};
  ForEveryTarget([&] {
    for (const auto& c : cases) {
      SCOPED_TRACE(std::to_string(c.bpp) + (c.hsl ? " bits, HSL, " : " bits, RGB, ") +
                   std::to_string(c.w) + " wide");
      const unsigned w = c.w, h = c.h;
      Image image =
          NoiseImage(w, h, c.bpp, c.format, (((c.bpp * w + 31) >> 3) & ~3u) + c.extraStride, 41);
      // Planes as the red, green and blue bytes of each pixel (hue, saturation and lightness).
      std::vector<uint8_t> planes[3], alpha;
      for (unsigned i = 0; i < w * h; ++i) {
        const tagRGBQUAD q = image->GetPixelColor(i % w, i / w, true);
        const tagRGBQUAD t = c.hsl ? CxImage::RGBtoHSL(q) : q;
        planes[0].push_back(t.rgbRed);
        planes[1].push_back(t.rgbGreen);
        planes[2].push_back(t.rgbBlue);
        alpha.push_back(q.rgbReserved);
      }
      for (auto& plane : planes) {
        const std::vector<uint8_t> before = plane;
        dct_Denosing(plane.data(), plane.data(), w, h, w, sigma);
        EXPECT_NE(plane, before);  // hue and saturation change too
      }
      ASSERT_EQ(c.hsl ? deNoiseLumiance(image.get(), strength) : deNoiseRGB(image.get(), strength),
                image.get());
      for (unsigned i = 0; i < w * h; ++i) {
        const tagRGBQUAD q{planes[2][i], planes[1][i], planes[0][i], 0};
        tagRGBQUAD expected = c.hsl ? CxImage::HSLtoRGB(q) : q;
        expected.rgbReserved = c.bpp == 32 ? alpha[i] : 0;
        const tagRGBQUAD actual = image->GetPixelColor(i % w, i / w, true);
        ASSERT_EQ(std::memcmp(&expected, &actual, 4), 0) << "pixel " << i;
      }
    }
  });
}

TEST(HslRows, GiveTheBytesOfCxImageConversionsForEveryColourOnEveryTarget) {
  // Every colour, and its three bytes read as hue, saturation and lightness.
  const CxImage& all = EveryColour();
  const size_t count = size_t(all.GetWidth()) * all.GetHeight();
  const uint8_t* pixels = all.GetBits();
  std::vector<uint8_t> triples(3 * count), hsl(3 * count), rgb(4 * count);
  for (size_t i = 0; i < count; ++i) {
    const uint8_t* p = pixels + 4 * i;
    const tagRGBQUAD t = CxImage::RGBtoHSL(tagRGBQUAD{p[0], p[1], p[2], p[3]});
    const tagRGBQUAD c = CxImage::HSLtoRGB(tagRGBQUAD{p[2], p[1], p[0], 0});
    const uint8_t h[3] = {t.rgbRed, t.rgbGreen, t.rgbBlue},
                  back[4] = {c.rgbBlue, c.rgbGreen, c.rgbRed, p[3]};
    for (size_t k = 0; k < 3; ++k) {
      triples[k * count + i] = p[k];
      hsl[k * count + i] = h[k];
    }
    std::copy(back, back + 4, &rgb[4 * i]);
  }
  ForEveryTarget([&] {
    std::vector<uint8_t> out(3 * count);
    tfx::RgbToHslRow(pixels, 4, false, &out[0], &out[count], &out[2 * count], count);
    EXPECT_TRUE(out == hsl);
    std::vector<uint8_t> back(pixels, pixels + 4 * count);
    tfx::HslToRgbRow(&triples[0], &triples[count], &triples[2 * count], back.data(), 4, false,
                     count);
    EXPECT_TRUE(back == rgb);
  });
}

}  // namespace
