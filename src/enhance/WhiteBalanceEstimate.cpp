// Colour measures for turning an automatic white balance into slider positions.
//
// Conversions run in float, the rates in double. The means are 64-bit sums over packed 4-byte
// pixels, divided with truncation and cut to their low byte.
#include "tessarofx/WhiteBalanceEstimate.h"

#include <climits>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <limits>

#include "base/ByteLimits.h"

namespace {

// Pixels in a width x height image; 0 for a size below 1 or an image above INT_MAX bytes.
size_t PixelCount(int width, int height) {
  if (width < 1 || height < 1 || !tfx::FitsInt(width, height, 4)) return 0;
  return static_cast<size_t>(width) * static_cast<size_t>(height);
}

struct Means {
  uint8_t red;
  uint8_t green;
  uint8_t blue;
};

Means ChannelMeans(const unsigned char* pixels, size_t count) {
  uint64_t sums[3] = {0, 0, 0};
  for (size_t i = 0; i < count; ++i, pixels += 4) {
    sums[0] += pixels[0];
    sums[1] += pixels[1];
    sums[2] += pixels[2];
  }
  return {static_cast<uint8_t>(sums[2] / count), static_cast<uint8_t>(sums[1] / count),
          static_cast<uint8_t>(sums[0] / count)};
}

float Linear(unsigned char c) {
  const float v = c / 255.0f;
  return v > 0.04045f ? std::pow((v + 0.055f) / 1.055f, 2.4f) : v / 12.92f;
}

struct Xyz {
  float X, Y, Z;
};

Xyz ToXyz(unsigned char r, unsigned char g, unsigned char b) {
  const float R = Linear(r), G = Linear(g), B = Linear(b);
  return {0.4124564f * R + 0.3575761f * G + 0.1804375f * B,
          0.2126729f * R + 0.7151522f * G + 0.072175f * B,
          0.0193339f * R + 0.119192f * G + 0.9503041f * B};
}

// The slope variable in float like the chromaticity it comes from; the cubic in double.
int64_t Mireds(float x, float y) {
  const float n = (x - 0.332f) / (0.1858f - y);
  const double T =
      437.0 * std::pow(static_cast<double>(n), 3.0) + 3601.0 * n * n + 6831.0 * n + 5517.0;
  const double mireds = 1.0 / T * 1000000.0;
  // Black has no chromaticity (0 / 0): such a colour, or one beyond 64 bits, gives INT64_MIN,
  // the value a hardware truncation reports for it, rather than undefined behaviour.
  if (!(mireds > -9223372036854775808.0 && mireds < 9223372036854775808.0)) {
    return std::numeric_limits<int64_t>::min();
  }
  return static_cast<int64_t>(mireds);
}

int64_t MiredsOf(Means m) {
  const Xyz c = ToXyz(m.red, m.green, m.blue);
  const float sum = c.X + c.Y + c.Z;
  return Mireds(c.X / sum, c.Y / sum);
}

double Limit(double rate) { return rate > 1.0 ? 1.0 : rate < -1.0 ? -1.0 : rate; }

constexpr Means kWhite = {255, 255, 255};

}  // namespace

unsigned char channelMean(const unsigned char* pixels, int width, int height, int channel) {
  const size_t count = PixelCount(width, height);
  if (!pixels || channel < 0 || channel > 3 || count == 0) return 255;
  // Byte 3 is never summed: its mean reads 0.
  if (channel == 3) return 0;
  uint64_t sum = 0;
  for (size_t i = 0; i < count; ++i) sum += pixels[i * 4 + static_cast<size_t>(channel)];
  return static_cast<unsigned char>(sum / count);
}

unsigned char* doAutoWhiteBalance(unsigned char* src, unsigned char* dst, int width, int height) {
  if (!src || !dst || PixelCount(width, height) == 0) return src;
  // One row only, on purpose: the balance itself is left to the caller.
  std::memmove(dst, src, static_cast<size_t>(width) * 4);
  return dst;
}

void rgb2xyz(unsigned char r, unsigned char g, unsigned char b, float& X, float& Y, float& Z) {
  const Xyz c = ToXyz(r, g, b);
  X = c.X;
  Y = c.Y;
  Z = c.Z;
}

void xyz2xy(float X, float Y, float Z, float& x, float& y, float& Yout) {
  const float sum = X + Y + Z;
  x = X / sum;
  y = Y / sum;
  Yout = Y;
}

int64_t xy_to_CCT_Hernandez1999(float x, float y) { return Mireds(x, y); }

double getAutoWhiteBalanceCCTChangeRate(const unsigned char* src, const unsigned char* corrected,
                                        int width, int height) {
  const size_t count = PixelCount(width, height);
  if (count == 0) return 0.0;
  const Means before = src ? ChannelMeans(src, count) : kWhite;
  const Means after = corrected ? ChannelMeans(corrected, count) : kWhite;
  // The difference wraps as 64-bit hardware arithmetic does when one side is INT64_MIN.
  const int64_t change = static_cast<int64_t>(static_cast<uint64_t>(MiredsOf(after)) -
                                              static_cast<uint64_t>(MiredsOf(before)));
  return Limit(static_cast<double>(change) / 11500.0) * 100.0 * 100.0;
}

double getAutoWhiteBalanceTintChangeRate(const unsigned char* src, const unsigned char* corrected,
                                         int width, int height) {
  const size_t count = PixelCount(width, height);
  if (count == 0) return 0.0;
  const int before = src ? ChannelMeans(src, count).red : 255;
  const int after = corrected ? ChannelMeans(corrected, count).red : 255;
  // Equal black means would make 0 / 0; equal images always measure 0.
  if (after == before) return 0.0;
  return Limit(static_cast<double>(after - before) / static_cast<double>(before)) * 100.0;
}

int64_t rgb2temperature(int r, int g, int b) {
  const double red = r / 255.0, green = g / 255.0, blue = b / 255.0;
  const double tolerance = 0.01568627450980392;
  const auto unit = [](double v) { return v < 0.0 ? 0.0 : v > 1.0 ? 1.0 : v; };
  const auto near = [&](double value, double curve) {
    return std::fabs(value - curve) <= tolerance;
  };
  if (blue == 1.0) {
    for (int64_t T = 6600; T < 40000; T += 100) {
      const double x = static_cast<double>(T) / 100.0 - 60.0;
      const double R = unit(1.292936186062745 * std::pow(x, -0.1332047592));
      const double G = unit(1.1298908608952942 * std::pow(x, -0.0755148492));
      if (near(red, R) && near(green, G)) return T;
    }
    return 40000;
  }
  const bool redOK = near(red, 1.0);
  if (blue == 0.0) {
    for (int64_t T = 1000; T < 1900; T += 100) {
      const double G =
          unit(0.3900815787690196 * std::log(static_cast<double>(T) / 100.0) - 0.6318414437886275);
      if (redOK && near(green, G)) return T;
    }
    return 1900;
  }
  for (int64_t T = 1900; T < 6600; T += 100) {
    const double x = static_cast<double>(T) / 100.0;
    const double G = unit(0.3900815787690196 * std::log(x) - 0.6318414437886275);
    const double B = unit(0.543206789110196 * std::log(x - 10.0) - 1.19625408914);
    if (redOK && near(green, G) && near(blue, B)) return T;
  }
  return 6600;
}
