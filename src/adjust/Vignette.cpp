// Vignette: a centred elliptical mask with a raised-cosine edge, then a per-pixel blend.
//
// The mask depends only on |x - cx| and |y - cy|, so one quadrant of it serves the whole frame.
// The blend runs in blocks of channel arrays so that the compiler can vectorise it; where the
// mask is exactly 1 (and, with a zero tone-curve weight, exactly 0) the channels do not
// interact and a 256-entry table built with the per-pixel arithmetic does the work.
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

// `yes` where mask is all ones, `no` where it is 0.
[[gnu::always_inline]] inline float Select(uint32_t mask, float yes, float no) {
  uint32_t y, n;
  std::memcpy(&y, &yes, 4);
  std::memcpy(&n, &no, 4);
  const uint32_t bits = (y & mask) | (n & ~mask);
  float out;
  std::memcpy(&out, &bits, 4);
  return out;
}

// All in float. Written once: vignettePixel, the tables and the row blocks evaluate the same
// expressions in the same order.
[[gnu::always_inline]] inline Channels Blend(Channels c, float g, float a, float e, float b) {
  const float gain = (1.0f + a) * (1.0f - g) + e * g;
  const Channels scaled = {c.red * gain, c.green * gain, c.blue * gain};
  const float inv = 1.0f - g;
  const float w =
      (1.0f - (scaled.red + scaled.green + scaled.blue) / 3.0f / 255.0f) * (inv * inv) * b;
  // The curve is always evaluated and then picked by a bit mask: with a plain conditional the
  // compiler may move the divisions into a branch, which keeps the block loop from vectorising.
  const uint32_t curve = g < 1.0f ? ~0u : 0u;
  return {Select(curve, Curve(scaled.red, w), scaled.red),
          Select(curve, Curve(scaled.green, w), scaled.green),
          Select(curve, Curve(scaled.blue, w), scaled.blue)};
}

// 0 below 0, else trunc(min(255, v)); NaN gives 255. Kept in float up to the conversion so
// that it vectorises.
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

// Whole pixels as little-endian words (blue in the low byte), alpha kept.
void TableRun(uint8_t* px, size_t count, const uint8_t table[256]) {
  for (size_t i = 0; i < count; ++i, px += 4) {
    uint32_t w;
    std::memcpy(&w, px, 4);
    w = (w & 0xff000000u) | table[w & 0xffu] | uint32_t{table[(w >> 8) & 0xffu]} << 8 |
        uint32_t{table[(w >> 16) & 0xffu]} << 16;
    std::memcpy(px, &w, 4);
  }
}

// Words again, so that unpacking and packing vectorise along with the arithmetic.
[[gnu::always_inline]] inline void BlendRun(uint8_t* px, const float* mask, size_t count,
                                            const VignetteBlend& p) {
  constexpr size_t kBlock = 64;
  uint32_t words[kBlock];
  float red[kBlock], green[kBlock], blue[kBlock];
  int32_t outRed[kBlock], outGreen[kBlock], outBlue[kBlock];
  for (size_t base = 0; base < count; base += kBlock, px += 4 * kBlock) {
    const size_t n = count - base < kBlock ? count - base : kBlock;
    std::memcpy(words, px, 4 * n);
    for (size_t j = 0; j < n; ++j) {
      blue[j] = static_cast<float>(words[j] & 0xffu);
      green[j] = static_cast<float>((words[j] >> 8) & 0xffu);
      red[j] = static_cast<float>((words[j] >> 16) & 0xffu);
    }
    for (size_t j = 0; j < n; ++j) {
      const Channels out = Blend({red[j], green[j], blue[j]}, mask[base + j], p.a, p.e, p.b);
      outRed[j] = ToByte(out.red);
      outGreen[j] = ToByte(out.green);
      outBlue[j] = ToByte(out.blue);
    }
    for (size_t j = 0; j < n; ++j) {
      words[j] = (words[j] & 0xff000000u) | static_cast<uint32_t>(outBlue[j]) |
                 static_cast<uint32_t>(outGreen[j]) << 8 | static_cast<uint32_t>(outRed[j]) << 16;
    }
    std::memcpy(px, words, 4 * n);
  }
}

void BlendRunBaseline(uint8_t* px, const float* mask, size_t count, const VignetteBlend& p) {
  BlendRun(px, mask, count, p);
}

#if defined(__x86_64__) || defined(__i386__)
__attribute__((target("avx2"))) void BlendRunAvx2(uint8_t* px, const float* mask, size_t count,
                                                  const VignetteBlend& p) {
  BlendRun(px, mask, count, p);
}
#endif

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

}  // namespace

const std::vector<const VignetteKernel*>& SupportedVignetteKernels() {
  static const std::vector<const VignetteKernel*> kernels = [] {
    static const VignetteKernel baseline = {"baseline", BlendRunBaseline};
    std::vector<const VignetteKernel*> list;
#if defined(__x86_64__) || defined(__i386__)
    static const VignetteKernel avx2 = {"AVX2", BlendRunAvx2};
    if (__builtin_cpu_supports("avx2")) list.push_back(&avx2);
#endif
    list.push_back(&baseline);
    return list;
  }();
  return kernels;
}

VignetteBlend MakeVignetteBlend(float a, float e, float b, const VignetteKernel& kernel) {
  VignetteBlend p;
  p.a = a;
  p.e = e;
  p.b = b;
  p.kernel = &kernel;
  // With g = 1 the tone curve is skipped, so each channel depends on itself alone. With g = 0 it
  // is applied with weight (...) * b, which is a signed zero, again channel by channel, when b is
  // 0 and the scaled channels and their sum stay finite.
  const float outsideGain = (1.0f + a) * (1.0f - 0.0f) + e * 0.0f;
  p.outsideByTable = b == 0.0f && std::isfinite(outsideGain * 765.0f);
  for (int v = 0; v < 256; ++v) {
    const uint8_t u = static_cast<uint8_t>(v);
    p.inside[v] = BlendPixel(tagRGBQUAD{u, u, u, 0}, 1.0f, a, e, b).rgbBlue;
    p.outside[v] = BlendPixel(tagRGBQUAD{u, u, u, 0}, 0.0f, a, e, b).rgbBlue;
  }
  return p;
}

void VignetteRow(uint8_t* bgra, const float* mask, size_t count, const VignetteBlend& blend) {
  // Runs of one kind: inside, outside by table, or blended pixel by pixel.
  const bool outside = blend.outsideByTable;
  size_t i = 0;
  while (i < count) {
    size_t end = i + 1;
    if (mask[i] == 1.0f) {
      while (end < count && mask[end] == 1.0f) ++end;
      TableRun(bgra + 4 * i, end - i, blend.inside);
    } else if (outside && mask[i] == 0.0f) {
      while (end < count && mask[end] == 0.0f) ++end;
      TableRun(bgra + 4 * i, end - i, blend.outside);
    } else {
      while (end < count && mask[end] != 1.0f && !(outside && mask[end] == 0.0f)) ++end;
      blend.kernel->blendRun(bgra + 4 * i, mask + i, end - i, blend);
    }
    i = end;
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
  const std::unique_ptr<float[]> quadrant =
      tfx::GradientQuadrant(width, height, feather / 100.0f, size / 100.0f, roundness / 100.0f);
  std::unique_ptr<float[]> row(new (std::nothrow) float[img->GetWidth()]);
  if (!quadrant || !row) return img;

  // powf: the exposure gain in single precision.
  const float e = std::pow(2.0f, exposure / 100.0f);
  const float a = amount / 100.0f;
  const float b = std::fabs(a) * (2.0f * highlights / 100.0f - 1.0f);
  const tfx::VignetteBlend blend = tfx::MakeVignetteBlend(a, e, b);

  const int cy = height >> 1;
  const size_t qw = size_t(width >> 1) + 1;
  const bool packed = img->GetBpp() == 32 && img->getFormat() == IPF_BGRA;
  for (int y = 0; y < height; ++y) {
    tfx::MirrorRow(quadrant.get() + size_t(y < cy ? cy - y : y - cy) * qw, width, row.get());
    if (packed) {
      tfx::VignetteRow(img->GetBits() + size_t(y) * img->GetEffWidth(), row.get(), img->GetWidth(),
                       blend);
      continue;
    }
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
