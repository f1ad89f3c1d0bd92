// The colour adjustments with the row-kernel set as an argument, so that tests can run every set
// the machine supports against the same reference.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "simd/color_adjust_rows.h"
#include "tessarofx/CxImage.h"

namespace tfx {

CxImage* ExposureAdjust(CxImage* image, float e, const ColorAdjustRows& rows);
CxImage* BrightnessAdjust(CxImage* image, float b, const ColorAdjustRows& rows);
CxImage* ContrastAdjust(CxImage* image, float c, const ColorAdjustRows& rows);
// Exposure, brightness and contrast in that order, the same bytes as the three calls; on packed,
// unpadded 32-bit images the three curves become one table and one pass.
CxImage* ToneAdjust(CxImage* image, float e, float b, float c, const ColorAdjustRows& rows);
CxImage* VibranceAdjust(CxImage* image, float v, const ColorAdjustRows& rows);
CxImage* SaturationAdjust(CxImage* image, float s, const ColorAdjustRows& rows);

// The five operations, in the effect's order, made ready for any number of packed 4-byte rows
// (padding is not skipped: brightness would not skip it either). Where the tone curve and
// vibrance keep each pixel's channels in order, one pass does all five; otherwise the curves,
// vibrance and saturation run one after the other on each row given.
class ColorAdjustPlan {
 public:
  ColorAdjustPlan(float e, float b, float c, float v, float s, const ColorAdjustRows& rows);
  ColorAdjustPlan(const ColorAdjustPlan&) = delete;
  ColorAdjustPlan& operator=(const ColorAdjustPlan&) = delete;
  bool Empty() const { return !hasTone_ && !hasVibrance_ && !hasSaturation_; }
  bool Fused() const { return fused_; }
  void Apply(uint8_t* pixels, size_t count) const { ApplyInto(pixels, pixels, count); }
  // The same on `count` pixels of `src` written to `dst` (which may be `src`).
  void ApplyInto(uint8_t* dst, const uint8_t* src, size_t count) const;

 private:
  bool Fuse();

  const ColorAdjustRows* rows_;
  uint8_t tone_[256];
  bool hasTone_ = false;
  bool hasVibrance_, hasSaturation_;
  float vibrance_;  // the kernels' strength
  float sigma_;
  std::vector<uint64_t> ends_;
  std::vector<float> gains_;
  FusedColourTables tables_ = {};
  bool fused_ = false;
};

}  // namespace tfx
