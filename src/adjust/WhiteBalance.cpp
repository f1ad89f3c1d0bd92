// Temperature, tint and automatic balance on a CxImage, and the balance of the WhiteBalanceAdjust
// effect on OpenCV matrices.
//
// Every per-channel step becomes a 256-entry table built with the per-pixel arithmetic. The
// temperature's HSL round trip runs on packed pixels in vector kernels with the same float
// expressions as CxImage::RGBtoHSL/HSLtoRGB, so the row loops give the bytes of the per-pixel
// forms.
#include "tessarofx/WhiteBalance.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <new>
#include <opencv2/core.hpp>

#include "adjust/ImageWalk.h"
#include "adjust/WhiteBalanceFormulas.h"
#include "simd/color_adjust_rows.h"
#include "simd/hsl_relight.h"

namespace {

using tfx::ForEachPixel;
using tfx::ForEachRow;

// Truncated and limited to 0..255; NaN gives 0.
uint8_t FloatToByte(float v) {
  if (!(v > 0.0f)) return 0;
  return static_cast<uint8_t>(v < 255.0f ? static_cast<int>(v) : 255);
}

// ClampToByte, inlined: the exported one is a call through the plug-in's symbol table.
uint8_t ClampInt(int v) { return static_cast<uint8_t>(v < 0 ? 0 : v > 255 ? 255 : v); }

uint8_t ClampWide(int64_t v) { return static_cast<uint8_t>(v < 0 ? 0 : v > 255 ? 255 : v); }

int Max3(int a, int b, int c) { return std::max(std::max(a, b), c); }
int Min3(int a, int b, int c) { return std::min(std::min(a, b), c); }

// Byte offsets of red and blue within a packed 4-byte pixel; green is byte 1, alpha byte 3.
struct Packing {
  int red = 2;
  int blue = 0;
};

bool PackedPixels(const CxImage& image, Packing* packing) {
  if (!image.GetBits() || image.GetBpp() != 32) return false;
  if (image.getFormat() == IPF_BGRA) {
    *packing = {2, 0};
    return true;
  }
  if (image.getFormat() == IPF_RGBA) {
    *packing = {0, 2};
    return true;
  }
  return false;
}

template <class ColourFn>
void ForEachColour(const CxImage& image, ColourFn colour) {
  for (unsigned long y = 0; y < image.GetHeight(); ++y) {
    for (unsigned long x = 0; x < image.GetWidth(); ++x) colour(image.GetPixelColor(x, y, true));
  }
}

// Table lookups on red, green and blue of packed pixels; alpha untouched.
void ApplyTables(CxImage* image, const Packing& pk, const uint8_t red[256],
                 const uint8_t green[256], const uint8_t blue[256]) {
  ForEachRow(image, [&](uint8_t* p, size_t count) {
    for (size_t i = 0; i < count; ++i, p += 4) {
      p[pk.red] = red[p[pk.red]];
      p[1] = green[p[1]];
      p[pk.blue] = blue[p[pk.blue]];
    }
  });
}

// ---- automatic balance ---------------------------------------------------------------------

// Per sum of blue + green + red: how many pixels have it and their channel totals, so that the
// totals above any threshold are suffix sums and the image is read once. 64-bit counts: a frame of
// 8-bit pixels may hold more than INT_MAX of one sum.
struct SumHistogram {
  int64_t count[768] = {};
  int64_t red[768] = {};
  int64_t green[768] = {};
  int64_t blue[768] = {};

  void Add(int r, int g, int b) {
    const int s = r + g + b;
    ++count[s];
    red[s] += r;
    green[s] += g;
    blue[s] += b;
  }
};

// calThreshold over counts of either width.
template <class Count>
int Threshold(const Count* histogram, float width, float height, float ratio) {
  const float limit = ratio * width * height;
  int64_t running = 0;
  for (int i = 767; i >= 0; --i) {
    running += histogram[i];
    if (static_cast<float>(running) > limit) return i;
  }
  return 0;
}

void BrightestAverageTable(int64_t sum, int64_t count, uint8_t table[256]) {
  // 64-bit totals: a frame of 2^23 white pixels already overflows 32 bits.
  const int64_t average = sum == 0 ? 0 : sum / count;
  for (int v = 0; v < 256; ++v) {
    table[v] = average == 0 ? static_cast<uint8_t>(v)
                            : static_cast<uint8_t>(std::min<int64_t>(v * 255 / average, 255));
  }
}

// ---- temperature ---------------------------------------------------------------------------

double Clamp01(double v) { return v < 0.0 ? 0.0 : v > 1.0 ? 1.0 : v; }

uint8_t UnitToByte(double v) { return static_cast<uint8_t>(static_cast<int>(v * 255.0)); }

uint8_t MixChannel(int c, int t, float w) {
  return FloatToByte(tfx::MixValue(static_cast<float>(c), static_cast<float>(t), w));
}

// The channel pulled towards the black-body colour, truncated, then blended with weight w.
uint8_t TemperatureChannel(int ch, float tch, float w) {
  const auto tinted =
      static_cast<uint8_t>(static_cast<int>(tfx::TintedChannel(static_cast<float>(ch), tch)));
  return MixChannel(ch, tinted, w);
}

// ---- tint ----------------------------------------------------------------------------------

int TintLuma(int r, int g, int b) { return (117 * b + 601 * g + 306 * r) >> 10; }

}  // namespace

// ---- the effect's balance --------------------------------------------------------------------

bool AdjustWhiteBalance::Process(cv::Mat& src, cv::Mat& dst, ColorGain gain, float a, float b) {
  (void)gain;  // part of the interface; the balance is temperature and tint only
  const int channels = src.channels();
  if (src.empty() || dst.empty() || src.depth() != CV_8U || dst.depth() != CV_8U || channels < 3) {
    return true;
  }
  const tfx::BalanceFactors f = tfx::DeriveBalance(a, b);
  const float gains[3] = {f.blue, f.green, f.red};
  const tfx::ColorAdjustRows& kernels = tfx::BestColorAdjustRows();
  // Pixels wider than four bytes go through tables of the same products.
  uint8_t blue[256], green[256], red[256];
  if (channels != 4) {
    for (int v = 0; v < 256; ++v) {
      blue[v] = FloatToByte(static_cast<float>(v) * f.blue);
      green[v] = FloatToByte(static_cast<float>(v) * f.green);
      red[v] = FloatToByte(static_cast<float>(v) * f.red);
    }
  }
  const auto run = [&](const uint8_t* s, uint8_t* d, size_t bytes) {
    const size_t pixels = bytes / static_cast<size_t>(channels);
    if (channels == 4) {
      kernels.scaleChannels(d, s, pixels, gains);
      return;
    }
    for (size_t i = 0; i < pixels; ++i, s += channels, d += channels) {
      const uint8_t pixel[3] = {blue[s[0]], green[s[1]], red[s[2]]};
      std::memmove(d + 3, s + 3, static_cast<size_t>(channels) - 3);
      std::memcpy(d, pixel, 3);
    }
  };
  // Flat byte positions of continuous data; otherwise row by row over the common rectangle.
  if (src.isContinuous() && dst.isContinuous()) {
    run(src.data, dst.data, std::min(src.total() * src.elemSize(), dst.total() * dst.elemSize()));
  } else {
    const int rows = std::min(src.rows, dst.rows);
    const size_t bytes = std::min(static_cast<size_t>(src.cols) * src.elemSize(),
                                  static_cast<size_t>(dst.cols) * dst.elemSize());
    for (int y = 0; y < rows; ++y) run(src.ptr(y), dst.ptr(y), bytes);
  }
  return true;
}

// ---- automatic balance -----------------------------------------------------------------------

int calThreshold(int* histogram, int width, int height, float ratio) {
  if (!histogram) return 0;
  return Threshold(histogram, static_cast<float>(width), static_cast<float>(height), ratio);
}

CxImage* whiteBalanceAdjustment(CxImage* image, float v) {
  if (!tfx::IsSoundImage(image) || v == 0.0f) return image;
  const float ratio = v / 500.0f;

  SumHistogram hist;
  Packing pk;
  const bool packed = PackedPixels(*image, &pk);
  if (packed) {
    ForEachRow(image, [&](uint8_t* p, size_t count) {
      for (size_t i = 0; i < count; ++i, p += 4) hist.Add(p[pk.red], p[1], p[pk.blue]);
    });
  } else {
    ForEachColour(*image, [&](tagRGBQUAD c) { hist.Add(c.rgbRed, c.rgbGreen, c.rgbBlue); });
  }

  const int threshold = Threshold(hist.count, static_cast<float>(image->GetWidth()),
                                  static_cast<float>(image->GetHeight()), ratio);
  int64_t count = 0, red = 0, green = 0, blue = 0;
  for (int s = threshold + 1; s < 768; ++s) {
    count += hist.count[s];
    red += hist.red[s];
    green += hist.green[s];
    blue += hist.blue[s];
  }
  uint8_t redTable[256], greenTable[256], blueTable[256];
  BrightestAverageTable(red, count, redTable);
  BrightestAverageTable(green, count, greenTable);
  BrightestAverageTable(blue, count, blueTable);

  if (packed) {
    ApplyTables(image, pk, redTable, greenTable, blueTable);
  } else {
    ForEachPixel(image, [&](tagRGBQUAD c) {
      c.rgbRed = redTable[c.rgbRed];
      c.rgbGreen = greenTable[c.rgbGreen];
      c.rgbBlue = blueTable[c.rgbBlue];
      return c;
    });
  }
  return image;
}

// ---- temperature -----------------------------------------------------------------------------

tagRGBQUAD temperatureToRGB(long kelvin) {
  const double x = kelvin < 1000 ? 10.0 : static_cast<double>(std::min(kelvin, 40000L)) / 100.0;
  double red, green, blue;
  if (x <= 66.0) {
    red = 1.0;
    green = Clamp01(std::log(x) * 0.3900815787690196 - 0.6318414437886275);
  } else {
    red = Clamp01(1.292936186062745 * std::pow(x - 60.0, -0.1332047592));
    green = Clamp01(1.1298908608952942 * std::pow(x - 60.0, -0.0755148492));
  }
  if (x >= 66.0) {
    blue = 1.0;
  } else if (x <= 19.0) {
    blue = 0.0;
  } else {
    blue = Clamp01(std::log(x - 10.0) * 0.543206789110196 - 1.19625408914);
  }
  return tagRGBQUAD{UnitToByte(blue), UnitToByte(green), UnitToByte(red), 0};
}

int luminance(tagRGBQUAD c) {
  return (Max3(c.rgbRed, c.rgbGreen, c.rgbBlue) + Min3(c.rgbRed, c.rgbGreen, c.rgbBlue)) >> 1;
}

tagRGBQUAD mixColorAndTmpColor(tagRGBQUAD c, tagRGBQUAD t, float w) {
  c.rgbBlue = MixChannel(c.rgbBlue, t.rgbBlue, w);
  c.rgbGreen = MixChannel(c.rgbGreen, t.rgbGreen, w);
  c.rgbRed = MixChannel(c.rgbRed, t.rgbRed, w);
  return c;
}

CxImage* temperatureAdjustment(CxImage* image, long t) {
  if (!tfx::IsSoundImage(image) || t == 11500) return image;
  const tfx::TemperatureBlend blend = tfx::DeriveTemperature(t);
  const float tR = blend.red, tG = blend.green, tB = blend.blue, w = blend.w;

  // The blend is per channel, so the whole colour M is three lookups.
  uint8_t mixRed[256], mixGreen[256], mixBlue[256];
  for (int v = 0; v < 256; ++v) {
    mixRed[v] = TemperatureChannel(v, tR, w);
    mixGreen[v] = TemperatureChannel(v, tG, w);
    mixBlue[v] = TemperatureChannel(v, tB, w);
  }

  Packing pk;
  if (PackedPixels(*image, &pk)) {
    tfx::BestHslRelightRows().relight(image->GetBits(), image->GetWidth(), image->GetHeight(),
                                      image->GetEffWidth(), pk.red, mixRed, mixGreen, mixBlue);
  } else {
    ForEachPixel(image, [&](tagRGBQUAD c) {
      const tagRGBQUAD mixed{mixBlue[c.rgbBlue], mixGreen[c.rgbGreen], mixRed[c.rgbRed], 0};
      tagRGBQUAD hsl = CxImage::RGBtoHSL(mixed);
      hsl.rgbBlue = static_cast<uint8_t>(luminance(c));
      tagRGBQUAD out = CxImage::HSLtoRGB(hsl);
      out.rgbReserved = c.rgbReserved;
      return out;
    });
  }
  return image;
}

CxImage* createTemperateColor(int width, int height) {
  auto* image = new (std::nothrow) CxImage();
  if (!image || width <= 0 || height <= 0) return image;
  if (!image->Create(static_cast<unsigned>(width), static_cast<unsigned>(height), 24, IPF_RGB)) {
    return image;
  }
  uint8_t* row = image->GetBits();
  const size_t stride = image->GetEffWidth();
  std::memset(row, 0, stride);  // the padding too, so that every row is the same bytes
  for (int x = 0; x < width; ++x) {
    const tagRGBQUAD c = temperatureToRGB(30000L - 100L * x);
    row[3 * x] = c.rgbBlue;
    row[3 * x + 1] = c.rgbGreen;
    row[3 * x + 2] = c.rgbRed;
  }
  for (int y = 1; y < height; ++y) std::memcpy(row + y * stride, row, stride);
  return image;
}

// ---- tint --------------------------------------------------------------------------------------

tagRGBQUAD calNewTintPixel(tagRGBQUAD c, int kr, int kg, int kb) {
  // 64-bit products: any int factor is accepted without overflow.
  const int64_t y = TintLuma(c.rgbRed, c.rgbGreen, c.rgbBlue);
  c.rgbRed = ClampWide(c.rgbRed + ((kr * y) >> 8));
  c.rgbGreen = ClampWide(c.rgbGreen + ((kg * y) >> 8));
  c.rgbBlue = ClampWide(c.rgbBlue + ((kb * y) >> 8));
  return c;
}

CxImage* tintAdjustment(CxImage* image, float t) {
  if (!tfx::IsSoundImage(image) || t == 0.0f) return image;
  // t * 100 in float; |k| <= 2^23, so Y * k stays within 32 bits.
  const int k = tfx::TintFactor(t);
  Packing pk;
  if (!PackedPixels(*image, &pk)) {
    ForEachPixel(image, [&](tagRGBQUAD c) { return calNewTintPixel(c, k, -k, k); });
    return image;
  }
  int redBlueShift[256], greenShift[256];
  for (int y = 0; y < 256; ++y) {
    redBlueShift[y] = (y * k) >> 8;
    greenShift[y] = (y * -k) >> 8;
  }
  ForEachRow(image, [&](uint8_t* p, size_t count) {
    for (size_t i = 0; i < count; ++i, p += 4) {
      const int r = p[pk.red], g = p[1], b = p[pk.blue];
      const int y = TintLuma(r, g, b);
      p[pk.red] = ClampInt(r + redBlueShift[y]);
      p[1] = ClampInt(g + greenShift[y]);
      p[pk.blue] = ClampInt(b + redBlueShift[y]);
    }
  });
  return image;
}
