// The light adjustments as the effect runs them: all four in one call, folded into one table pass
// where that gives the same bytes as the four image functions in turn.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "tessarofx/CxImage.h"

namespace tfx {

struct ColorAdjustRows;

// A light table maps a channel c of a pixel whose brightest channel is M to table[M * 256 + c];
// only the entries with c <= M are meaningful.
inline constexpr size_t kLightTableSize = 256 * 256;

// hdrHighlight(h), hdrShadow(s), hdrWhiteLevel(w), hdrBlackLevel(k0) in that order.
CxImage* LightAdjust(CxImage* image, float h, float s, float w, float k0);

// Composes the four operations into one light table. Each operation weighs a pixel by its
// brightest channel after the previous ones, which one table can only know when no operation lets
// a darker channel overtake the brightest; otherwise this returns false and LightAdjust runs the
// operations one by one.
bool FoldLightAdjust(float h, float s, float w, float k0, uint8_t* table);

// The four operations made ready for any number of packed 4-byte rows: one folded table where
// FoldLightAdjust allows, else one table per operation, applied in turn to each row given.
class LightAdjustPlan {
 public:
  LightAdjustPlan(float h, float s, float w, float k0);
  bool Empty() const { return count_ == 0; }
  void Apply(uint8_t* pixels, size_t count) const { ApplyInto(pixels, pixels, count); }
  // The same on `count` pixels of `src` written to `dst` (which may be `src`); with nothing to
  // do, `dst` is left as it is.
  void ApplyInto(uint8_t* dst, const uint8_t* src, size_t count) const;

 private:
  const ColorAdjustRows* rows_;
  std::vector<uint8_t> tables_;
  size_t count_ = 0;
};

}  // namespace tfx
