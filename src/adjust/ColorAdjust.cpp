// Exposure, brightness, contrast, vibrance and saturation.
//
// Each image function derives its parameters once, then either runs a row kernel over packed
// 4-byte pixels or, for other layouts, applies the per-pixel form through the accessors. The
// per-channel operations become a 256-entry table built with the per-pixel arithmetic, so every
// path gives the same bytes.
#include "tessarofx/ColorAdjust.h"

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <vector>

#include "adjust/ColorAdjustFormulas.h"
#include "adjust/ColorAdjustRows.h"
#include "adjust/ImageWalk.h"

namespace tfx {
namespace {

// 0 below 0, else trunc(min(255, v)).
uint8_t FloatToByte(float v) {
  if (v < 0.0f) return 0;
  return static_cast<uint8_t>(static_cast<int>(v < 255.0f ? v : 255.0f));
}

uint8_t ScaleChannel(int channel, float gain) {
  return FloatToByte(static_cast<float>(channel) * gain);
}

uint8_t ClampWide(int64_t v) { return static_cast<uint8_t>(v < 0 ? 0 : v > 255 ? 255 : v); }

// In 64 bits, so that limits from any caller give the exact quotient rather than overflowing; a
// d of 0 is the steepest ramp there is, which leaves nothing between lo and 255.
uint8_t ContrastChannel(int channel, int lo, int hi, int d) {
  if (lo < 1) return ClampWide(int64_t{channel} * d / 255 - lo);
  if (channel <= lo) return 0;
  if (channel > hi || d == 0) return 255;
  return ClampWide((int64_t{channel} - lo) * 255 / d);
}

// (channel * (k + 256) - luma * k) >> 8 in wrapping 32-bit arithmetic, so that absurd strengths
// give the bytes the vector kernels give rather than undefined behaviour.
uint8_t MixChannel(int channel, int luma, int k) {
  const uint32_t mixed = static_cast<uint32_t>(channel) * (static_cast<uint32_t>(k) + 256u) -
                         static_cast<uint32_t>(luma) * static_cast<uint32_t>(k);
  return ClampToByte(static_cast<int32_t>(mixed) >> 8);
}

int Max3(int a, int b, int c) {
  const int ab = a > b ? a : b;
  return ab > c ? ab : c;
}

int Min3(int a, int b, int c) {
  const int ab = a < b ? a : b;
  return ab < c ? ab : c;
}

tagRGBQUAD MapColour(tagRGBQUAD c, const uint8_t table[256]) {
  c.rgbBlue = table[c.rgbBlue];
  c.rgbGreen = table[c.rgbGreen];
  c.rgbRed = table[c.rgbRed];
  return c;
}

void ApplyTable(CxImage* image, const uint8_t table[256], const ColorAdjustRows& rows) {
  if (HasPackedColour(*image)) {
    ForEachRow(image, [&](uint8_t* pixels, size_t count) {
      rows.applyTable(pixels, pixels, count, table);
    });
  } else {
    ForEachPixel(image, [&](tagRGBQUAD c) { return MapColour(c, table); });
  }
}

tagRGBQUAD VibrancePixel(tagRGBQUAD c, float strength) {
  const unsigned char luma = calLuma(c);
  // The byte negation is intended: a mask luma of 0 gives weight 0, any other L gives 256 - L.
  const unsigned char weight = static_cast<unsigned char>(-calLuma(calMask(c, luma)));
  return mixLumaAndColor(c, luma, weight, strength);
}

void ExposureTable(float e, uint8_t table[256]) {
  const float gain = ExposureGain(e);
  // ScaleChannel also floors at 0, which a positive gain never reaches.
  for (int v = 0; v < 256; ++v) table[v] = ScaleChannel(v, gain);
}

void BrightnessTable(float b, uint8_t table[256]) {
  const float k = BrightnessFactor(b);
  for (int v = 0; v < 256; ++v) table[v] = FloatToByte(BrightnessValue(static_cast<float>(v), k));
}

void ContrastTable(float c, uint8_t table[256]) {
  const ContrastLimits limits = DeriveContrast(c);
  for (int v = 0; v < 256; ++v) table[v] = ContrastChannel(v, limits.lo, limits.hi, limits.d);
}

// The exposure, brightness and contrast curves composed into one table; false when all three are
// no-ops (the table is then the identity).
bool ComposeTone(float e, float b, float c, uint8_t table[256]) {
  for (int v = 0; v < 256; ++v) table[v] = static_cast<uint8_t>(v);
  uint8_t step[256];
  bool any = false;
  const auto compose = [&](float strength, void (*build)(float, uint8_t*)) {
    if (strength == 0.0f) return;
    build(strength, step);
    for (int v = 0; v < 256; ++v) table[v] = step[table[v]];
    any = true;
  };
  compose(e, ExposureTable);
  compose(b, BrightnessTable);
  compose(c, ContrastTable);
  return any;
}

}  // namespace

CxImage* ExposureAdjust(CxImage* image, float e, const ColorAdjustRows& rows) {
  if (!IsSoundImage(image) || e == 0.0f) return image;
  uint8_t table[256];
  ExposureTable(e, table);
  ApplyTable(image, table, rows);
  return image;
}

CxImage* BrightnessAdjust(CxImage* image, float b, const ColorAdjustRows& rows) {
  if (!IsSoundImage(image) || b == 0.0f) return image;
  uint8_t table[256];
  BrightnessTable(b, table);

  uint8_t* bits = image->GetBits();
  const size_t pixels = size_t{image->GetWidth()} * image->GetHeight();
  const size_t step = image->GetBpp() / 8;
  const size_t size = image->GetSize();
  if (step == 4) {
    // Row padding is ignored on purpose: width * height pixels from the first byte.
    const size_t count = pixels < size / 4 ? pixels : size / 4;
    rows.applyTable(bits, bits, count, table);
    return image;
  }
  // Narrower pixels still get three bytes each, so neighbouring windows overlap; the walk stops
  // at the end of the buffer.
  for (size_t i = 0, offset = 0; i < pixels; ++i, offset += step) {
    for (size_t j = 0; j < 3 && offset + j < size; ++j) bits[offset + j] = table[bits[offset + j]];
  }
  return image;
}

CxImage* ContrastAdjust(CxImage* image, float c, const ColorAdjustRows& rows) {
  if (!IsSoundImage(image) || c == 0.0f) return image;
  uint8_t table[256];
  ContrastTable(c, table);
  ApplyTable(image, table, rows);
  return image;
}

CxImage* ToneAdjust(CxImage* image, float e, float b, float c, const ColorAdjustRows& rows) {
  if (!IsSoundImage(image)) return image;
  // Brightness walks width * height pixels whatever the stride, so only unpadded rows let the
  // three curves act as one; elsewhere they run one after the other.
  if (!HasPackedColour(*image) || image->GetEffWidth() != image->GetWidth() * 4) {
    return ContrastAdjust(BrightnessAdjust(ExposureAdjust(image, e, rows), b, rows), c, rows);
  }
  uint8_t table[256];
  if (ComposeTone(e, b, c, table)) ApplyTable(image, table, rows);
  return image;
}

ColorAdjustPlan::ColorAdjustPlan(float e, float b, float c, float v, float s,
                                 const ColorAdjustRows& rows)
    : rows_(&rows),
      hasVibrance_(v != 0.0f),
      hasSaturation_(s != 0.0f),
      vibrance_(hasVibrance_ ? VibranceStrength(v) : 0.0f),
      sigma_(s / 100.0f) {
  hasTone_ = ComposeTone(e, b, c, tone_);
  if (!Empty() && !Fuse()) {
    ends_.clear();
    gains_.clear();
  }
}

namespace {

// Saturation's sat of a pair of largest and smallest channel (top > bottom), and 1 / sat - 1,
// its gain where sat + sigma >= 1. Neither depends on the settings, and their divisions took most
// of a plan's build, which settings that change every frame pay on every frame; so they are worked
// out once, for every pair.
struct PairSaturation {
  float sat, inverse;
};

struct PairSaturations {
  std::vector<PairSaturation> pairs;  // at top * (top - 1) / 2 + bottom
  bool halfSums;                      // l * 255 is half of top + bottom for every pair
};

const PairSaturations& SaturationOfPairs() {
  static const PairSaturations table = [] {
    PairSaturations t{std::vector<PairSaturation>(256 * 255 / 2), true};
    for (int top = 0; top < 256; ++top) {
      for (int bottom = 0; bottom <= top; ++bottom) {
        const SaturationSpread p = SpreadOf(static_cast<float>(top), static_cast<float>(bottom));
        if (p.lv != static_cast<float>(top + bottom) * 0.5f) t.halfSums = false;
        if (bottom == top) continue;
        const float sat = SaturationOf(p);
        t.pairs[static_cast<size_t>(top * (top - 1) / 2 + bottom)] = {sat, 1.0f / sat - 1.0f};
      }
    }
    return t;
  }();
  return table;
}

}  // namespace

// What vibrance and saturation derive from each pair of largest and smallest channel, as the
// per-pixel forms derive it; false where one pass could not give the operations' bytes.
bool ColorAdjustPlan::Fuse() {
  if (!hasVibrance_ && !hasSaturation_) {
    tables_ = {tone_, 0.0f, false, true, nullptr, nullptr, 1.0f};
    fused_ = true;
    return true;
  }
  for (int i = 0; i < 255; ++i) {
    if (tone_[i] > tone_[i + 1]) return false;
  }
  // Beyond this vibrance's k no longer fits the kernels' 16-bit products.
  if (!(std::fabs(255.0f * vibrance_) < 32768.0f) || !std::isfinite(sigma_)) return false;
  // Vibrance's k of each weight of a pixel's mask, as mixLumaAndColor works it out. Below -256
  // it would turn a channel's order round.
  int vibranceK[256];
  for (int weight = 0; weight < 256; ++weight) {
    vibranceK[weight] = TruncToInt(static_cast<float>(weight) * vibrance_);
    if (vibranceK[weight] < -256) return false;
  }
  const bool increase = sigma_ >= 0.0f;
  const PairSaturations* saturations = hasSaturation_ ? &SaturationOfPairs() : nullptr;
  // The kernels take l * 255 as half the sum.
  if (saturations && !saturations->halfSums) return false;
  const float fixedGain = 1.0f / (1.0f - sigma_) - 1.0f;
  // Only the table the kernels read is filled: when settings change from frame to frame, the
  // plan is built for every frame.
  const bool readsEnds = rows_->readsEnds;
  const bool readsGains = !readsEnds && hasSaturation_ && increase;
  if (readsEnds) ends_.assign(256 * 256, 0);
  if (readsGains) gains_.assign(256 * 256, 0.0f);
  for (int mx = 0; mx < 256; ++mx) {
    for (int mn = 0; mn <= mx; ++mn) {
      // VibrancePixel of (mn, mn, mx): the mask of the largest channel is mx - luma, of the
      // others 0.
      int top = mx, bottom = mn;
      if (hasVibrance_) {
        const int luma = (mn + mx) >> 1;
        const int k = vibranceK[static_cast<uint8_t>(-((mx - luma) >> 1))];
        top = MixChannel(mx, luma, k);
        bottom = MixChannel(mn, luma, k);
      }
      // The pair after vibrance, which keeps the two channels largest and smallest.
      if (top < bottom) return false;
      int topOut = top, bottomOut = bottom;
      float a = 0.0f;  // a grey stays as it is, whatever the gain
      if (hasSaturation_ && top != bottom) {
        // calNewColor's arithmetic on the pair.
        const PairSaturation& pair = saturations->pairs[top * (top - 1) / 2 + bottom];
        if (increase) {
          a = pair.sat + sigma_ >= 1.0f ? pair.inverse : fixedGain;
          if (!std::isfinite(a)) return false;
        }
        if (readsEnds) {
          const float lv = static_cast<float>(top + bottom) * 0.5f;
          topOut = FloatToByte(SaturatedBy(static_cast<float>(top), lv, sigma_, a));
          bottomOut = FloatToByte(SaturatedBy(static_cast<float>(bottom), lv, sigma_, a));
        }
      }
      const size_t index = static_cast<size_t>(mx) * 256 + mn;
      if (readsGains) gains_[index] = a;
      if (readsEnds) {
        uint32_t bits;
        std::memcpy(&bits, &a, sizeof(bits));
        ends_[index] = static_cast<uint32_t>(topOut) | static_cast<uint32_t>(bottomOut) << 8 |
                       static_cast<uint32_t>(top + bottom) << 16 | uint64_t{bits} << 32;
      }
    }
  }
  tables_ = {hasTone_ ? tone_ : nullptr,
             vibrance_,
             hasSaturation_,
             increase,
             readsEnds ? ends_.data() : nullptr,
             readsGains ? gains_.data() : nullptr,
             1.0f + sigma_};
  fused_ = true;
  return true;
}

void ColorAdjustPlan::ApplyInto(uint8_t* dst, const uint8_t* src, size_t count) const {
  if (Fused()) {
    rows_->fusedColour(dst, src, count, tables_);
    return;
  }
  if (dst != src) std::memcpy(dst, src, count * 4);
  uint8_t* pixels = dst;
  if (hasTone_) rows_->applyTable(pixels, pixels, count, tone_);
  if (hasVibrance_) rows_->vibrance(pixels, count, vibrance_);
  if (hasSaturation_) rows_->saturation(pixels, count, sigma_);
}

CxImage* VibranceAdjust(CxImage* image, float v, const ColorAdjustRows& rows) {
  if (!IsSoundImage(image) || v == 0.0f) return image;
  const float strength = VibranceStrength(v);
  if (HasPackedColour(*image)) {
    ForEachRow(image,
               [&](uint8_t* pixels, size_t count) { rows.vibrance(pixels, count, strength); });
  } else {
    ForEachPixel(image, [&](tagRGBQUAD c) { return VibrancePixel(c, strength); });
  }
  return image;
}

CxImage* SaturationAdjust(CxImage* image, float s, const ColorAdjustRows& rows) {
  if (!IsSoundImage(image) || s == 0.0f) return image;
  // sigma in float.
  const float sigma = s / 100.0f;
  if (HasPackedColour(*image)) {
    ForEachRow(image,
               [&](uint8_t* pixels, size_t count) { rows.saturation(pixels, count, sigma); });
  } else {
    ForEachPixel(image, [&](tagRGBQUAD c) { return calNewColor(c, sigma); });
  }
  return image;
}

}  // namespace tfx

CxImage* exposureAdjustment(CxImage* image, float e) {
  return tfx::ExposureAdjust(image, e, tfx::BestColorAdjustRows());
}

CxImage* brightnessAdjustment(CxImage* image, float b) {
  return tfx::BrightnessAdjust(image, b, tfx::BestColorAdjustRows());
}

CxImage* contrastAdjustment(CxImage* image, float c) {
  return tfx::ContrastAdjust(image, c, tfx::BestColorAdjustRows());
}

CxImage* vibranceAdjustment(CxImage* image, float v) {
  return tfx::VibranceAdjust(image, v, tfx::BestColorAdjustRows());
}

CxImage* saturationAdjustment(CxImage* image, float s) {
  return tfx::SaturationAdjust(image, s, tfx::BestColorAdjustRows());
}

tagRGBQUAD calPowColor(tagRGBQUAD c, float gain) {
  c.rgbBlue = tfx::ScaleChannel(c.rgbBlue, gain);
  c.rgbGreen = tfx::ScaleChannel(c.rgbGreen, gain);
  c.rgbRed = tfx::ScaleChannel(c.rgbRed, gain);
  return c;
}

tagRGBQUAD calContrastColor(tagRGBQUAD c, int lo, int hi, int d) {
  c.rgbBlue = tfx::ContrastChannel(c.rgbBlue, lo, hi, d);
  c.rgbGreen = tfx::ContrastChannel(c.rgbGreen, lo, hi, d);
  c.rgbRed = tfx::ContrastChannel(c.rgbRed, lo, hi, d);
  return c;
}

unsigned char calLuma(tagRGBQUAD c) {
  return static_cast<unsigned char>(
      (tfx::Min3(c.rgbRed, c.rgbGreen, c.rgbBlue) + tfx::Max3(c.rgbRed, c.rgbGreen, c.rgbBlue)) >>
      1);
}

tagRGBQUAD calMask(tagRGBQUAD c, unsigned char luma) {
  c.rgbBlue = ClampToByte(c.rgbBlue - luma);
  c.rgbGreen = ClampToByte(c.rgbGreen - luma);
  c.rgbRed = ClampToByte(c.rgbRed - luma);
  c.rgbReserved = ClampToByte(c.rgbReserved - luma);
  return c;
}

tagRGBQUAD mixLumaAndColor(tagRGBQUAD c, unsigned char luma, unsigned char mask, float strength) {
  const int k = tfx::TruncToInt(static_cast<float>(mask) * strength);
  c.rgbBlue = tfx::MixChannel(c.rgbBlue, luma, k);
  c.rgbGreen = tfx::MixChannel(c.rgbGreen, luma, k);
  c.rgbRed = tfx::MixChannel(c.rgbRed, luma, k);
  return c;
}

tagRGBQUAD calNewColor(tagRGBQUAD c, float s) {
  const int mx = tfx::Max3(c.rgbRed, c.rgbGreen, c.rgbBlue);
  const int mn = tfx::Min3(c.rgbRed, c.rgbGreen, c.rgbBlue);
  if (mx == mn) return c;
  const tfx::SaturationSpread spread =
      tfx::SpreadOf(static_cast<float>(mx), static_cast<float>(mn));
  const auto apply = [&](uint8_t channel) {
    return tfx::FloatToByte(tfx::SaturatedChannel(channel, spread, s));
  };
  c.rgbBlue = apply(c.rgbBlue);
  c.rgbGreen = apply(c.rgbGreen);
  c.rgbRed = apply(c.rgbRed);
  return c;
}
