// White balance: the temperature/tint balance that the WhiteBalanceAdjust effect applies, the
// stand-alone balance functions on a CxImage, and an estimator that finds the white point of an
// image and derives channel gains from it.
//
// The image functions change blue, green and red in place, keep alpha, and return the image they
// were given. A neutral strength leaves everything untouched, and so does an image that is null,
// has no pixels, or whose header does not describe its buffer: a bpp other than 8, 16, 24 or 32,
// a stride shorter than a row, or a size other than stride * height (as when that product
// wrapped 32 bits). 32-bit BGRA and RGBA images take a direct row loop that gives the same bytes as
// the per-pixel accessors, which every other format goes through.
#pragma once

#include <cstdint>
#include <vector>

#include "tessarofx/CxImage.h"
#include "tessarofx/Export.h"

namespace cv {
class Mat;
}

// Per-channel gains.
struct ColorGain {
  float r;
  float g;
  float b;
};

// The balance of the WhiteBalanceAdjust effect. Holds no state.
class TFX_API AdjustWhiteBalance {
 public:
  // Scales blue by 1 + 0.5 b - a, green by 1 - b and red by 1 + 0.5 b + a, each product
  // truncated and limited to 0..255; the fourth byte of 4-channel pixels is copied. `a` is
  // temperature / 200 (positive warms), `b` is tint / 200 (positive takes green away). `gain` is
  // accepted and ignored. Reads 8-bit matrices of 3 or more channels (others are left alone) and
  // writes the same byte positions of `dst`, up to the smaller of the two; src and dst may be the
  // same buffer. Always true.
  bool Process(cv::Mat& src, cv::Mat& dst, ColorGain gain, float a, float b);
};

// Automatic balance by the brightest pixels: the pixels whose blue + green + red exceeds
// calThreshold(histogram, width, height, v / 500) are averaged, and each channel is scaled so
// that its average becomes 255 (channel * 255 / average, integer division, at most 255). A zero
// average leaves its channel unchanged, so a black image stays black; v <= 0 changes nothing.
TFX_API CxImage* whiteBalanceAdjustment(CxImage* image, float v);

// The highest index T of a 768-entry histogram of blue + green + red sums at which the count of
// entries from 767 down to T exceeds ratio * width * height (compared in float); 0 if it never
// does or the histogram is null.
TFX_API int calThreshold(int* histogram, int width, int height, float ratio);

// Black-body colour of a temperature in kelvin (1000..40000; lower values give 1000's colour,
// higher ones 40000's) as red, green, blue with alpha 0: 6600 K and above has full blue, below
// 6600 K full red, 1900 K and below no blue.
TFX_API tagRGBQUAD temperatureToRGB(long kelvin);

// Colour temperature with t = 11500 as neutral. Below it the image is pulled towards the
// black-body colour of K = 26000 - t kelvin, above it towards K = max(18100 - t, 1700) kelvin:
// each channel tinted to trunc(ch / 255 * tch * 255), blended back with weight
// |1 - K / 11500| * 1.7 (see mixColorAndTmpColor). The result keeps its hue and saturation but
// takes the lightness (max + min) >> 1 of the original pixel, through CxImage::RGBtoHSL and
// HSLtoRGB. The mapping jumps at 11500 (about 14500 K on one side, 6600 K on the other).
TFX_API CxImage* temperatureAdjustment(CxImage* image, long t);

// A width x height 24-bit image tagged IPF_RGB whose column x holds the black-body colour of
// 30000 - 100 x kelvin, stored as the bytes blue, green, red (opposite to the tag). The caller
// owns the result and deletes it; a zero or negative size, or one whose bytes do not fit 32 bits
// (see CxImage::Create), gives an empty image.
TFX_API CxImage* createTemperateColor(int width, int height);

// Tint: k = trunc(t * 100) >> 8; red and blue gain (Y * k) >> 8, green (Y * -k) >> 8, with
// Y = (117 blue + 601 green + 306 red) >> 10. Positive t is magenta, negative green.
TFX_API CxImage* tintAdjustment(CxImage* image, float t);

// (max + min) >> 1 of the three colour channels.
TFX_API int luminance(tagRGBQUAD c);

// t * w + c * (1 - w) per colour channel in float, limited to 0..255 and truncated; c's alpha.
TFX_API tagRGBQUAD mixColorAndTmpColor(tagRGBQUAD c, tagRGBQUAD t, float w);

// Adds (k * Y) >> 8 to each colour channel (kr to red, kg to green, kb to blue), Y as in
// tintAdjustment, limited to 0..255; alpha kept.
TFX_API tagRGBQUAD calNewTintPixel(tagRGBQUAD c, int kr, int kg, int kb);

// One colour of the estimator, in memory order.
struct BGRAColor {
  uint8_t b;
  uint8_t g;
  uint8_t r;
  uint8_t a;
};

// One converted pixel: Y 0..255, Cb and Cr signed around 0.
struct YCbCrSample {
  int16_t y;
  int16_t cb;
  int16_t cr;
};

// One block of the image as the estimator sees it: where it lies, its mean colour in both
// spaces, the average absolute deviation of its chroma, and how it was judged.
struct WhitePointinfo {
  int x;  // top-left pixel of the block
  int y;
  int width;
  int height;
  float meanY;
  float meanCb;  // chroma is signed: 0 is neutral
  float meanCr;
  float avdCb;
  float avdCr;
  float meanB;  // mean colour, for the gains
  float meanG;
  float meanR;
  int clipped;     // pixels with a channel at or above kClipLevel
  bool candidate;  // passed the block tests
  bool nearWhite;  // on the neutral axis of the candidates
};

// White-point estimation in YCbCr (BT.601 full range, Cb and Cr signed around 0).
//
// The image is cut into blocks of kBlockSize pixels. A block is a candidate when
//   - it is bright enough to measure: mean Y >= kMinLuma;
//   - none of its pixels is at clipping: every B, G, R < kClipLevel (a clipped channel no longer
//     shows the cast, and a few clipped pixels already pull the block's mean towards neutral);
//   - it is one surface rather than an edge or texture: average absolute deviation of Cb and of
//     Cr <= kMaxAVD;
//   - it could be a grey under a moderate cast: |mean Cb| and |mean Cr| <= kNearWhiteRatio *
//     mean Y (a cast of 15% on red and blue puts a grey near 0.1 Y, a cast of 20% near 0.14 Y).
// Greys under one cast all have the same Cb / Y and Cr / Y, while muted colours that pass the
// test above scatter around them. So the neutral axis is the pixel-weighted median of Cb / Y and
// of Cr / Y over the candidates, and the near-white blocks are the candidates within
// kClusterRadius of it on both (the nearest candidate if none is). The brightest near-white
// blocks (by mean Y, the top kBrightFraction of them and at least one) make the white point:
// their pixel-weighted mean colour. The gains bring that colour to grey with green fixed at 1:
// gain = mean green / mean channel. Without candidates the gains stay 1.
//
// Every call that takes a BGRA buffer refuses (false, or an all-zero block) a buffer above
// INT_MAX bytes (stride * height) as well as the cases it names.
//
// One object is used by one thread at a time.
class TFX_API AutoWhiteBalance {
 public:
  static constexpr int kBlockSize = 32;
  static constexpr float kMinLuma = 40.0f;
  static constexpr int kClipLevel = 250;
  static constexpr float kMaxAVD = 6.0f;
  static constexpr float kNearWhiteRatio = 0.15f;
  static constexpr float kClusterRadius = 0.02f;
  static constexpr float kBrightFraction = 0.1f;

  AutoWhiteBalance();

  // Fills the fixed-point tables behind BGR2YCbCr (done by the constructor).
  void CalcLut_BGR2YCBCR();
  // Forgets the image and the blocks; the white point becomes zero and the gains 1.
  void Reset();

  // One colour through the tables: Y 0..255, Cb and Cr about -128..127.
  void BGR2YCbCr(uint8_t b, uint8_t g, uint8_t r, int* y, int* cb, int* cr) const;
  // Converts a whole BGRA image (rows `stride` bytes apart) into the object's Y, Cb, Cr planes.
  // False, leaving the object reset, for a null image or a non-positive size or stride below
  // width * 4.
  bool BGR2YCbCr(const uint8_t* bgra, int width, int height, int stride);

  // Mean Y, Cb and Cr of the block (its x, y, width and height) in the converted planes. A null
  // block, or one without pixels or reaching outside the converted image, is left unchanged.
  void CalcMean(WhitePointinfo* block) const;
  // Average absolute deviation of Cb and Cr from the block's mean Cb and Cr; refuses the blocks
  // CalcMean refuses.
  void CalcAVD(WhitePointinfo* block) const;
  // Measures the block at (x, y), kBlockSize square and clipped to the image, and decides
  // whether it is a candidate. `bgra` is the image last passed to BGR2YCbCr. A null image, a
  // position outside the image or a stride below width * 4 give an all-zero block.
  WhitePointinfo FindWhitePointBlock(const uint8_t* bgra, int stride, int x, int y) const;
  // Measures every block of the image last passed to BGR2YCbCr (`bgra`, `stride` as given
  // there), then sets the white point to the pixel-weighted mean colour of the brightest
  // candidates, with its gains. False, changing neither, when no block qualifies.
  bool FindWhitePoint(const uint8_t* bgra, int stride);

  // The whole estimate: conversion, white point, gains. False (gains 1) when nothing qualifies.
  bool AutoCalcGain(const uint8_t* bgra, int width, int height, int stride);
  // Gains that make the colour (b, g, r) grey with green at 1: g / b, 1, g / r. All 1 when a
  // channel is 0 or below.
  static ColorGain CalcGain(float b, float g, float r);

  // Takes `white` as the white point and derives the gains from it.
  void SetWhitePoint(const BGRAColor& white);
  // Takes the mean colour of the (2 radius + 1)-pixel square around (x, y), clipped to the
  // image, as the white point; any radius works, a negative one as 0. False when the image is
  // null, (x, y) lies outside it or the stride is below width * 4.
  bool SetWhitePointPos(const uint8_t* bgra, int width, int height, int stride, int x, int y,
                        int radius = 2);

  // The WhiteBalanceAdjust positions (u_temperature, u_tint, each -100..100) whose factors have
  // the ratios of the current gains as closely as the range allows.
  void CalcAdjustPos(float* temperature, float* tint) const;

  // Applies the current gains: each channel times its gain, rounded and limited to 0..255;
  // alpha kept. src and dst may be the same buffer. False for null buffers or a bad size.
  bool Process(const uint8_t* src, uint8_t* dst, int width, int height, int srcStride,
               int dstStride) const;

  ColorGain Gain() const { return gain_; }
  BGRAColor WhitePoint() const { return white_; }
  // The blocks of the last FindWhitePoint, row by row.
  const std::vector<WhitePointinfo>& Blocks() const { return blocks_; }

 private:
  // Fixed point with 16 fraction bits; Cb's blue and Cr's red coefficient is the shared 0.5.
  int32_t lutYR_[256], lutYG_[256], lutYB_[256];
  int32_t lutCbR_[256], lutCbG_[256], lutHalf_[256];
  int32_t lutCrG_[256], lutCrB_[256];
  void SetWhite(float b, float g, float r);

  int width_ = 0;
  int height_ = 0;
  std::vector<YCbCrSample> samples_;  // the converted image, row by row
  std::vector<WhitePointinfo> blocks_;
  BGRAColor white_;
  ColorGain gain_;
};
