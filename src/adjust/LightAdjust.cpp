// Highlight, shadow, white level and black level.
//
// A pixel's result depends on its channel and on its brightest channel M, so each operation
// becomes a 256 x 256 byte table indexed by (M, channel), built with the per-pixel arithmetic.
// Only the lower triangle (channel <= M) is ever read, so only that is built. A table pass costs
// about as much as the float curve vectorised for AVX-512 and a third of it in scalar code, and
// the effect's four operations fold into one pass.
#include "tessarofx/LightAdjust.h"

#include <climits>
#include <cstring>
#include <vector>

#include "adjust/ImageWalk.h"
#include "adjust/LightAdjustFormulas.h"
#include "adjust/LightAdjustTables.h"
#include "simd/color_adjust_rows.h"

namespace tfx {
namespace {

// Float to int toward zero; out-of-range values and NaN give INT_MIN, the x86 conversion result,
// instead of being undefined.
int TruncToInt(float v) {
  if (v >= -2147483648.0f && v < 2147483648.0f) return static_cast<int>(v);
  return INT_MIN;
}

uint8_t LowByte(float v) { return static_cast<uint8_t>(TruncToInt(v)); }

// 0 below 0, else trunc(min(255, v)); NaN gives 255.
uint8_t LimitedByte(float v) {
  if (v < 0.0f) return 0;
  return static_cast<uint8_t>(static_cast<int>(v < 255.0f ? v : 255.0f));
}

int Brightest(tagRGBQUAD c) {
  const int bg = c.rgbBlue > c.rgbGreen ? c.rgbBlue : c.rgbGreen;
  return bg > c.rgbRed ? bg : c.rgbRed;
}

enum class Op { kHighlight, kShadow, kWhiteLevel, kBlackLevel };

template <Op op>
float Weight(int brightest, float a) {
  const auto m = static_cast<float>(brightest);
  return op == Op::kHighlight || op == Op::kWhiteLevel ? BrightWeight(m, a) : DarkWeight(m, a);
}

template <Op op>
uint8_t Channel(float ch, float k) {
  if (op == Op::kWhiteLevel) return LimitedByte(WhiteCurve(ch, k));
  if (op == Op::kBlackLevel) return LimitedByte(Curve(ch, k));
  return LowByte(Curve(ch, k));
}

template <Op op>
tagRGBQUAD Pixel(tagRGBQUAD c, float a) {
  const float k = Weight<op>(Brightest(c), a);
  c.rgbBlue = Channel<op>(c.rgbBlue, k);
  c.rgbGreen = Channel<op>(c.rgbGreen, k);
  c.rgbRed = Channel<op>(c.rgbRed, k);
  return c;
}

template <Op op>
void BuildTable(float a, uint8_t* table) {
  for (int m = 0; m < 256; ++m) {
    const float k = Weight<op>(m, a);
    uint8_t* row = table + m * 256;
    for (int c = 0; c <= m; ++c) row[c] = Channel<op>(static_cast<float>(c), k);
  }
}

// One operation with the argument of its per-pixel form.
struct Step {
  void (*build)(float a, uint8_t* table);
  float a;
};

// The operations with a non-zero strength, in the effect's order.
std::vector<Step> Steps(float h, float s, float w, float k0) {
  std::vector<Step> steps;
  if (h != 0.0f) steps.push_back({BuildTable<Op::kHighlight>, HighlightFactor(h)});
  if (s != 0.0f) steps.push_back({BuildTable<Op::kShadow>, ShadowFactor(s)});
  if (w != 0.0f) steps.push_back({BuildTable<Op::kWhiteLevel>, WhiteLevelFactor(w)});
  if (k0 != 0.0f) steps.push_back({BuildTable<Op::kBlackLevel>, BlackLevelFactor(k0)});
  return steps;
}

void ApplyTable(CxImage* image, const uint8_t* table) {
  if (HasPackedColour(*image)) {
    // M and the curve treat red, green and blue alike, so both packed orders qualify.
    const ColorAdjustRows& rows = BestColorAdjustRows();
    ForEachRow(image, [&](uint8_t* pixels, size_t count) {
      rows.brightestTable(pixels, pixels, count, table);
    });
    return;
  }
  for (unsigned long y = 0; y < image->GetHeight(); ++y) {
    for (unsigned long x = 0; x < image->GetWidth(); ++x) {
      tagRGBQUAD c = image->GetPixelColor(x, y, true);
      const uint8_t* row = table + 256 * Brightest(c);
      c.rgbBlue = row[c.rgbBlue];
      c.rgbGreen = row[c.rgbGreen];
      c.rgbRed = row[c.rgbRed];
      image->SetPixelColor(x, y, c);
    }
  }
}

CxImage* ApplyStep(CxImage* image, const Step& step) {
  std::vector<uint8_t> table(kBrightestTableBytes);
  step.build(step.a, table.data());
  ApplyTable(image, table.data());
  return image;
}

}  // namespace

bool FoldLightAdjust(float h, float s, float w, float k0, uint8_t* table) {
  const std::vector<Step> steps = Steps(h, s, w, k0);
  std::vector<uint8_t> tables(steps.size() * kLightTableSize);
  for (size_t j = 0; j < steps.size(); ++j) {
    steps[j].build(steps[j].a, tables.data() + j * kLightTableSize);
  }
  for (int m = 0; m < 256; ++m) {
    uint8_t* out = table + m * 256;
    for (int c = 0; c <= m; ++c) out[c] = static_cast<uint8_t>(c);
    int top = m;  // the brightest channel so far
    for (size_t j = 0; j < steps.size(); ++j) {
      const uint8_t* row = tables.data() + j * kLightTableSize + top * 256;
      // Channels at or below top stay at or below row[top], so the next step's M is row[top]
      // and every lookup stays inside the built triangle.
      for (int c = 0; c < top; ++c) {
        if (row[c] > row[top]) return false;
      }
      for (int c = 0; c <= m; ++c) out[c] = row[out[c]];
      top = row[top];
    }
  }
  return true;
}

LightAdjustPlan::LightAdjustPlan(float h, float s, float w, float k0)
    : rows_(&BestColorAdjustRows()) {
  const std::vector<Step> steps = Steps(h, s, w, k0);
  if (steps.empty()) return;
  if (steps.size() > 1) {
    tables_.resize(kBrightestTableBytes);
    if (FoldLightAdjust(h, s, w, k0, tables_.data())) {
      count_ = 1;
      return;
    }
  }
  tables_.assign(steps.size() * kBrightestTableBytes, 0);
  for (size_t j = 0; j < steps.size(); ++j) {
    steps[j].build(steps[j].a, tables_.data() + j * kBrightestTableBytes);
  }
  count_ = steps.size();
}

void LightAdjustPlan::ApplyInto(uint8_t* dst, const uint8_t* src, size_t count) const {
  const uint8_t* from = src;
  for (size_t j = 0; j < count_; ++j, from = dst) {
    rows_->brightestTable(dst, from, count, tables_.data() + j * kBrightestTableBytes);
  }
}

CxImage* LightAdjust(CxImage* image, float h, float s, float w, float k0) {
  if (!IsSoundImage(image)) return image;
  // Formats read through the accessors may lose bits on every write (16-bit pixels), so only
  // packed ones fold.
  if (HasPackedColour(*image)) {
    const LightAdjustPlan plan(h, s, w, k0);
    if (!plan.Empty()) {
      ForEachRow(image, [&](uint8_t* pixels, size_t count) { plan.Apply(pixels, count); });
    }
    return image;
  }
  for (const Step& step : Steps(h, s, w, k0)) ApplyStep(image, step);
  return image;
}

}  // namespace tfx

CxImage* hdrHighlight(CxImage* image, float h) {
  if (!tfx::IsSoundImage(image) || h == 0.0f) return image;
  return tfx::ApplyStep(image, {tfx::BuildTable<tfx::Op::kHighlight>, tfx::HighlightFactor(h)});
}

CxImage* hdrShadow(CxImage* image, float s) {
  if (!tfx::IsSoundImage(image) || s == 0.0f) return image;
  return tfx::ApplyStep(image, {tfx::BuildTable<tfx::Op::kShadow>, tfx::ShadowFactor(s)});
}

CxImage* hdrWhiteLevel(CxImage* image, float w) {
  if (!tfx::IsSoundImage(image) || w == 0.0f) return image;
  return tfx::ApplyStep(image, {tfx::BuildTable<tfx::Op::kWhiteLevel>, tfx::WhiteLevelFactor(w)});
}

CxImage* hdrBlackLevel(CxImage* image, float k0) {
  if (!tfx::IsSoundImage(image) || k0 == 0.0f) return image;
  return tfx::ApplyStep(image, {tfx::BuildTable<tfx::Op::kBlackLevel>, tfx::BlackLevelFactor(k0)});
}

unsigned char enHanceColor(float ch, float k) { return tfx::LowByte(tfx::Curve(ch, k)); }

float whiteToneColor(float ch, float k) { return tfx::WhiteCurve(ch, k); }

float blackToneColor(float ch, float k) { return tfx::Curve(ch, k); }

float highLightColor(float ch, float k) { return tfx::Curve(ch, k); }

tagRGBQUAD calHighlight(tagRGBQUAD c, float a) { return tfx::Pixel<tfx::Op::kHighlight>(c, a); }

tagRGBQUAD calShadow(tagRGBQUAD c, float a) { return tfx::Pixel<tfx::Op::kShadow>(c, a); }

tagRGBQUAD calWhiteLevelPixel(tagRGBQUAD c, float a) {
  return tfx::Pixel<tfx::Op::kWhiteLevel>(c, a);
}

tagRGBQUAD calBlackLevelPixel(tagRGBQUAD c, float a) {
  return tfx::Pixel<tfx::Op::kBlackLevel>(c, a);
}
