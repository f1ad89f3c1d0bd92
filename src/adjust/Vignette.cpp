// Vignette: a centred elliptical mask with a raised-cosine edge, then a per-pixel blend.
//
// The mask depends only on |x - cx| and |y - cy|, so one quadrant of it serves the whole frame.
// Where the mask is exactly 1 (and, with a zero tone-curve weight, exactly 0) the channels do not
// interact and a 256-entry table built with the per-pixel arithmetic does the work; elsewhere a
// vector kernel blends pixel by pixel. A plan keeps all that for frames of one size and setting.
#include "tessarofx/Vignette.h"

#include <climits>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>
#include <vector>

#include "adjust/VignetteRows.h"
#include "base/ByteLimits.h"
#include "image/ImageLayout.h"
#include "simd/color_adjust_rows.h"

namespace tfx {
namespace {

struct Channels {
  float red;
  float green;
  float blue;
};

// The tone curve 255 - (255 - v)(255 - w v) / 255.
[[gnu::always_inline]] inline float Curve(float v, float w) {
  return 255.0f - (255.0f - v) * (255.0f - w * v) / 255.0f;
}

// All in float. vignettePixel and the tables evaluate these expressions, and the vector kernel
// the same ones in the same order.
[[gnu::always_inline]] inline Channels Blend(Channels c, float g, float a, float e, float b) {
  const float gain = (1.0f + a) * (1.0f - g) + e * g;
  const Channels scaled = {c.red * gain, c.green * gain, c.blue * gain};
  const float inv = 1.0f - g;
  const float w =
      (1.0f - (scaled.red + scaled.green + scaled.blue) / 3.0f / 255.0f) * (inv * inv) * b;
  if (!(g < 1.0f)) return scaled;
  return {Curve(scaled.red, w), Curve(scaled.green, w), Curve(scaled.blue, w)};
}

// 0 below 0, else trunc(min(255, v)); NaN gives 255.
[[gnu::always_inline]] inline int32_t ToByte(float v) {
  const float high = v < 255.0f ? v : 255.0f;
  return static_cast<int32_t>(v < 0.0f ? 0.0f : high);
}

tagRGBQUAD BlendPixel(tagRGBQUAD c, float g, float a, float e, float b) {
  const Channels out = Blend(
      {static_cast<float>(c.rgbRed), static_cast<float>(c.rgbGreen), static_cast<float>(c.rgbBlue)},
      g, a, e, b);
  c.rgbRed = static_cast<uint8_t>(ToByte(out.red));
  c.rgbGreen = static_cast<uint8_t>(ToByte(out.green));
  c.rgbBlue = static_cast<uint8_t>(ToByte(out.blue));
  return c;
}

// The mask for 0 <= dx <= width >> 1, 0 <= dy <= height >> 1, row-major, (width >> 1) + 1 wide.
// Geometry in float; only the cosine in double.
std::unique_ptr<float[]> GradientQuadrant(int width, int height, float feather, float size,
                                          float roundness) {
  const int qw = (width >> 1) + 1;
  const int qh = (height >> 1) + 1;
  std::unique_ptr<float[]> q(new (std::nothrow) float[size_t(qw) * size_t(qh)]);
  if (!q) return q;
  const float cx = static_cast<float>(width >> 1);
  const float cy = static_cast<float>(height >> 1);
  float A = cx * 0.2f * (4.0f * size + 1.0f);
  float B = cy * 0.2f * (4.0f * size + 1.0f);
  if (roundness >= 0.0f) {
    const float d = std::fabs(A - B) * roundness;
    if (A > B) {
      A -= d;
    } else if (B > A) {
      B -= d;
    }
  }
  const float W = (A > B ? A : B) * 0.5f * feather + 3.0f;
  const float A2 = A + W;
  const float B2 = B + W;
  const float kPi = 3.1415927f;
  // The x terms of both ellipse tests, per column: the same values the tests would compute.
  std::unique_ptr<float[]> columns(new (std::nothrow) float[2 * size_t(qw)]);
  if (!columns) return nullptr;
  float* innerX = columns.get();
  float* outerX = columns.get() + qw;
  for (int i = 0; i < qw; ++i) {
    const float dx = static_cast<float>(i);
    innerX[i] = (dx / A) * (dx / A);
    outerX[i] = (dx / A2) * (dx / A2);
  }
  for (int j = 0; j < qh; ++j) {
    float* row = q.get() + size_t(j) * size_t(qw);
    const float dy = static_cast<float>(j);
    const float innerY = (dy / B) * (dy / B);
    const float outerY = (dy / B2) * (dy / B2);
    for (int i = 0; i < qw; ++i) {
      if (innerX[i] + innerY - 1.0f <= 0.0f) {
        row[i] = 1.0f;
      } else if (outerX[i] + outerY - 1.0f < 0.0f) {
        // Distance from the centre to the outer ellipse along the pixel's ray, and the pixel's
        // own distance: their difference runs from W at the inner edge to 0 at the outer one.
        const float dx = static_cast<float>(i);
        const float slope = dy / (dx + 0.000001f);
        const float t = slope * slope;
        const float qq = 1.0f / (t / (B2 * B2) + 1.0f / (A2 * A2));
        const float edge = std::sqrt(t * qq + qq);
        // (cx - x)^2 is dx^2 bit for bit: negation is exact.
        const float dist = std::sqrt(dx * dx + dy * dy);
        const float angle = (W - (edge - dist)) * (kPi / W);
        row[i] = static_cast<float>((std::cos(static_cast<double>(angle)) + 1.0) * 0.5);
      } else {
        row[i] = 0.0f;
      }
    }
  }
  return q;
}

// Row y of the full mask from the quadrant: mirrored left of the centre column.
void MirrorRow(const float* quadrantRow, int width, float* out) {
  const int cx = width >> 1;
  for (int x = 0; x < cx; ++x) out[x] = quadrantRow[cx - x];
  std::memcpy(out + cx, quadrantRow, sizeof(float) * size_t(width - cx));
}

// Splits a row of mask weights into runs of one kind: inside, outside by table, or blended pixel
// by pixel; f(kind, start, end) for each in order.
template <class F>
void ForEachRun(const float* mask, size_t count, bool outsideByTable, F f) {
  size_t i = 0;
  while (i < count) {
    size_t end = i + 1;
    if (mask[i] == 1.0f) {
      while (end < count && mask[end] == 1.0f) ++end;
      f(RunKind::kInside, i, end);
    } else if (outsideByTable && mask[i] == 0.0f) {
      while (end < count && mask[end] == 0.0f) ++end;
      f(RunKind::kOutside, i, end);
    } else {
      while (end < count && mask[end] != 1.0f && !(outsideByTable && mask[end] == 0.0f)) ++end;
      f(RunKind::kBlend, i, end);
    }
    i = end;
  }
}

// Pixels [start, end) of a row; `mask` holds the weights of the run.
void ApplyRun(uint8_t* dstRow, const uint8_t* srcRow, RunKind kind, size_t start, size_t end,
              const float* mask, const VignetteBlend& blend) {
  uint8_t* px = dstRow + 4 * start;
  const uint8_t* from = srcRow + 4 * start;
  if (kind == RunKind::kInside && blend.insideUnchanged) {
    if (px != from) std::memcpy(px, from, 4 * (end - start));
  } else if (kind == RunKind::kBlend) {
    blend.kernel->blendRun(px, from, mask, end - start, blend);
  } else {
    // Red, green and blue alike, alpha kept.
    blend.tables->applyTable(px, from, end - start,
                             kind == RunKind::kInside ? blend.inside : blend.outside);
  }
}

}  // namespace

VignetteBlend MakeVignetteBlend(float a, float e, float b) {
  VignetteBlend p;
  p.a = a;
  p.e = e;
  p.b = b;
  p.kernel = &BestVignetteKernel();
  p.tables = &BestColorAdjustRows();
  // With g = 1 the tone curve is skipped, so each channel depends on itself alone. With g = 0 it
  // is applied with weight (...) * b, which is a signed zero, again channel by channel, when b is
  // 0 and the scaled channels and their sum stay finite.
  const float outsideGain = (1.0f + a) * (1.0f - 0.0f) + e * 0.0f;
  p.outsideByTable = b == 0.0f && std::isfinite(outsideGain * 765.0f);
  // The gain lies between 1 + a and e for every g in [0, 1].
  p.zeroWeight = b == 0.0f && std::isfinite((std::fabs(1.0f + a) + std::fabs(e)) * 765.0f);
  p.insideUnchanged = true;
  for (int v = 0; v < 256; ++v) {
    const uint8_t u = static_cast<uint8_t>(v);
    p.inside[v] = BlendPixel(tagRGBQUAD{u, u, u, 0}, 1.0f, a, e, b).rgbBlue;
    p.outside[v] = BlendPixel(tagRGBQUAD{u, u, u, 0}, 0.0f, a, e, b).rgbBlue;
    p.insideUnchanged = p.insideUnchanged && p.inside[v] == u;
  }
  return p;
}

void VignetteRow(uint8_t* bgra, const float* mask, size_t count, const VignetteBlend& blend) {
  ForEachRun(mask, count, blend.outsideByTable, [&](RunKind kind, size_t start, size_t end) {
    ApplyRun(bgra, bgra, kind, start, end, mask + start, blend);
  });
}

VignettePlan::VignettePlan(int width, int height, float amount, float feather, float highlights,
                           float size, float roundness, float exposure)
    : height_(height) {
  if (width <= 0 || height <= 0 || (amount == 0.0f && exposure == 0.0f)) return;
  const std::unique_ptr<float[]> quadrant =
      GradientQuadrant(width, height, feather / 100.0f, size / 100.0f, roundness / 100.0f);
  std::unique_ptr<float[]> row(new (std::nothrow) float[size_t(width)]);
  if (!quadrant || !row) return;
  // powf: the exposure gain in single precision.
  const float e = std::pow(2.0f, exposure / 100.0f);
  const float a = amount / 100.0f;
  const float b = std::fabs(a) * (2.0f * highlights / 100.0f - 1.0f);
  blend_ = MakeVignetteBlend(a, e, b);
  const int qh = (height >> 1) + 1;
  const size_t qw = size_t(width >> 1) + 1;
  firstRun_.reserve(size_t(qh) + 1);
  for (int j = 0; j < qh; ++j) {
    firstRun_.push_back(runs_.size());
    MirrorRow(quadrant.get() + size_t(j) * qw, width, row.get());
    ForEachRun(row.get(), size_t(width), blend_.outsideByTable,
               [&](RunKind kind, size_t start, size_t end) {
                 runs_.push_back({kind, start, end, masks_.size()});
                 if (kind == RunKind::kBlend) {
                   masks_.insert(masks_.end(), row.get() + start, row.get() + end);
                 }
               });
  }
  firstRun_.push_back(runs_.size());
  active_ = true;
}

void VignettePlan::ApplyInto(uint8_t* dst, const uint8_t* src, size_t stride, int y0,
                             int rows) const {
  if (!active_) {
    if (dst != src) std::memcpy(dst, src, stride * static_cast<size_t>(rows));
    return;
  }
  const int cy = height_ >> 1;
  for (int y = y0; y < y0 + rows; ++y, dst += stride, src += stride) {
    const size_t j = size_t(y < cy ? cy - y : y - cy);
    for (size_t r = firstRun_[j]; r < firstRun_[j + 1]; ++r) {
      const Run& run = runs_[r];
      ApplyRun(dst, src, run.kind, run.start, run.end, masks_.data() + run.mask, blend_);
    }
  }
}

}  // namespace tfx

CxImage* vignetteAdjustFilter(CxImage* img, float amount, float feather, float highlights,
                              float size, float roundness, float exposure) {
  if (!tfx::IsSoundImage(img) || img->GetWidth() > INT_MAX || img->GetHeight() > INT_MAX) {
    return img;
  }
  if (amount == 0.0f && exposure == 0.0f) return img;
  const int width = static_cast<int>(img->GetWidth());
  const int height = static_cast<int>(img->GetHeight());
  if (img->GetBpp() == 32 && img->getFormat() == IPF_BGRA) {
    const tfx::VignettePlan plan(width, height, amount, feather, highlights, size, roundness,
                                 exposure);
    plan.Apply(img->GetBits(), img->GetEffWidth(), 0, height);
    return img;
  }
  const std::unique_ptr<float[]> quadrant =
      tfx::GradientQuadrant(width, height, feather / 100.0f, size / 100.0f, roundness / 100.0f);
  std::unique_ptr<float[]> row(new (std::nothrow) float[img->GetWidth()]);
  if (!quadrant || !row) return img;

  // powf: the exposure gain in single precision.
  const float e = std::pow(2.0f, exposure / 100.0f);
  const float a = amount / 100.0f;
  const float b = std::fabs(a) * (2.0f * highlights / 100.0f - 1.0f);
  const int cy = height >> 1;
  const size_t qw = size_t(width >> 1) + 1;
  for (int y = 0; y < height; ++y) {
    tfx::MirrorRow(quadrant.get() + size_t(y < cy ? cy - y : y - cy) * qw, width, row.get());
    for (int x = 0; x < width; ++x) {
      const tagRGBQUAD c = img->GetPixelColor(x, y, true);
      img->SetPixelColor(x, y, tfx::BlendPixel(c, row[x], a, e, b));
    }
  }
  return img;
}

void generateGradient(int width, int height, float feather, float size, float roundness,
                      float* mask) {
  if (!mask || width <= 0 || height <= 0) return;
  if (!tfx::FitsInt(width, height, sizeof(float))) return;
  const std::unique_ptr<float[]> quadrant =
      tfx::GradientQuadrant(width, height, feather, size, roundness);
  if (!quadrant) return;
  const int cy = height >> 1;
  const size_t qw = size_t(width >> 1) + 1;
  for (int y = 0; y < height; ++y) {
    tfx::MirrorRow(quadrant.get() + size_t(y < cy ? cy - y : y - cy) * qw, width,
                   mask + size_t(y) * size_t(width));
  }
}

tagRGBQUAD vignettePixel(tagRGBQUAD c, float g, float a, float e, float b) {
  return tfx::BlendPixel(c, g, a, e, b);
}

float distance(float x1, float y1, float x2, float y2) {
  const float dx = x1 - x2;
  const float dy = y1 - y2;
  return std::sqrt(dx * dx + dy * dy);
}
