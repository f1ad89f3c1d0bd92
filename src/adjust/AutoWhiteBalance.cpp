// White-point estimation: blocks that are bright, unclipped, uniform in chroma and close to
// neutral are taken as lit white or grey surfaces; the brightest of them give the white point.
// The thresholds and their reasons are in the header.
#include <algorithm>
#include <climits>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <new>
#include <vector>

#include "base/ByteLimits.h"
#include "tessarofx/WhiteBalance.h"

namespace {

constexpr double kFixedOne = 65536.0;
constexpr int32_t kFixedHalf = 1 << 15;

void FillLut(int32_t lut[256], double coefficient) {
  for (int v = 0; v < 256; ++v) {
    lut[v] = static_cast<int32_t>(std::lround(coefficient * v * kFixedOne));
  }
}

// Arithmetic shift: negative chroma rounds to nearest like positive.
int FromFixed(int32_t v) { return (v + kFixedHalf) >> 16; }

uint8_t RoundToByte(float v) {
  return static_cast<uint8_t>(v >= 255.0f ? 255 : v <= 0.0f ? 0 : static_cast<int>(v + 0.5f));
}

// A caller's block lies inside the converted image (width x height) and holds pixels; in 64 bits,
// as x + width may pass INT_MAX.
// A BGRA buffer of `height` rows `stride` bytes apart, each holding `width` pixels, within the
// library's byte limit.
bool DescribesBuffer(const uint8_t* bgra, int width, int height, int stride) {
  return bgra && width > 0 && height > 0 && stride / 4 >= width && tfx::FitsInt(stride, height, 1);
}

bool InsideImage(const WhitePointinfo* block, int width, int height) {
  return block && block->x >= 0 && block->y >= 0 && block->width > 0 && block->height > 0 &&
         int64_t{block->x} + block->width <= width && int64_t{block->y} + block->height <= height;
}

// Vectors of the library's own types only: std:: containers of built-in types would be
// instantiated with default visibility and leak out of the plug-in.
struct Weighted {
  float value;
  double pixels;
};

// The value at which the blocks, taken in order of it, reach half of their pixels.
template <class ValueFn>
float WeightedMedian(const std::vector<WhitePointinfo*>& blocks, ValueFn value) {
  std::vector<Weighted> weighted;
  double total = 0;
  for (const WhitePointinfo* block : blocks) {
    const double pixels = static_cast<double>(block->width) * block->height;
    weighted.push_back(Weighted{value(*block), pixels});
    total += pixels;
  }
  std::sort(weighted.begin(), weighted.end(),
            [](const Weighted& a, const Weighted& b) { return a.value < b.value; });
  double reached = 0;
  for (const Weighted& w : weighted) {
    reached += w.pixels;
    if (reached >= total / 2) return w.value;
  }
  return weighted.back().value;
}

}  // namespace

AutoWhiteBalance::AutoWhiteBalance() {
  CalcLut_BGR2YCBCR();
  Reset();
}

void AutoWhiteBalance::CalcLut_BGR2YCBCR() {
  // BT.601, full range.
  FillLut(lutYR_, 0.299);
  FillLut(lutYG_, 0.587);
  FillLut(lutYB_, 0.114);
  FillLut(lutCbR_, -0.168736);
  FillLut(lutCbG_, -0.331264);
  FillLut(lutHalf_, 0.5);
  FillLut(lutCrG_, -0.418688);
  FillLut(lutCrB_, -0.081312);
}

void AutoWhiteBalance::Reset() {
  width_ = 0;
  height_ = 0;
  samples_.clear();
  blocks_.clear();
  white_ = BGRAColor{0, 0, 0, 0};
  gain_ = ColorGain{1.0f, 1.0f, 1.0f};
}

void AutoWhiteBalance::BGR2YCbCr(uint8_t b, uint8_t g, uint8_t r, int* y, int* cb, int* cr) const {
  if (y) *y = FromFixed(lutYR_[r] + lutYG_[g] + lutYB_[b]);
  if (cb) *cb = FromFixed(lutCbR_[r] + lutCbG_[g] + lutHalf_[b]);
  if (cr) *cr = FromFixed(lutHalf_[r] + lutCrG_[g] + lutCrB_[b]);
}

bool AutoWhiteBalance::BGR2YCbCr(const uint8_t* bgra, int width, int height, int stride) {
  Reset();
  if (!DescribesBuffer(bgra, width, height, stride)) return false;
  const size_t count = static_cast<size_t>(width) * static_cast<size_t>(height);
  try {
    samples_.resize(count);
  } catch (const std::bad_alloc&) {
    Reset();
    return false;
  }
  size_t i = 0;
  for (int row = 0; row < height; ++row) {
    const uint8_t* p = bgra + static_cast<size_t>(row) * static_cast<size_t>(stride);
    for (int x = 0; x < width; ++x, p += 4, ++i) {
      int y, cb, cr;
      BGR2YCbCr(p[0], p[1], p[2], &y, &cb, &cr);
      samples_[i] =
          YCbCrSample{static_cast<int16_t>(y), static_cast<int16_t>(cb), static_cast<int16_t>(cr)};
    }
  }
  width_ = width;
  height_ = height;
  return true;
}

void AutoWhiteBalance::CalcMean(WhitePointinfo* block) const {
  if (!InsideImage(block, width_, height_)) return;
  int64_t y = 0, cb = 0, cr = 0;
  for (int row = block->y; row < block->y + block->height; ++row) {
    const size_t start = static_cast<size_t>(row) * static_cast<size_t>(width_) + block->x;
    for (size_t i = start; i < start + static_cast<size_t>(block->width); ++i) {
      y += samples_[i].y;
      cb += samples_[i].cb;
      cr += samples_[i].cr;
    }
  }
  const double n = static_cast<double>(block->width) * block->height;
  block->meanY = static_cast<float>(y / n);
  block->meanCb = static_cast<float>(cb / n);
  block->meanCr = static_cast<float>(cr / n);
}

void AutoWhiteBalance::CalcAVD(WhitePointinfo* block) const {
  if (!InsideImage(block, width_, height_)) return;
  double cb = 0, cr = 0;
  for (int row = block->y; row < block->y + block->height; ++row) {
    const size_t start = static_cast<size_t>(row) * static_cast<size_t>(width_) + block->x;
    for (size_t i = start; i < start + static_cast<size_t>(block->width); ++i) {
      cb += std::fabs(samples_[i].cb - block->meanCb);
      cr += std::fabs(samples_[i].cr - block->meanCr);
    }
  }
  const double n = static_cast<double>(block->width) * block->height;
  block->avdCb = static_cast<float>(cb / n);
  block->avdCr = static_cast<float>(cr / n);
}

WhitePointinfo AutoWhiteBalance::FindWhitePointBlock(const uint8_t* bgra, int stride, int x,
                                                     int y) const {
  WhitePointinfo block{};
  if (!DescribesBuffer(bgra, width_, height_, stride) || x < 0 || y < 0 || x >= width_ ||
      y >= height_) {
    return block;
  }
  block.x = x;
  block.y = y;
  block.width = std::min(kBlockSize, width_ - x);
  block.height = std::min(kBlockSize, height_ - y);
  CalcMean(&block);
  CalcAVD(&block);

  int64_t b = 0, g = 0, r = 0;
  for (int row = y; row < y + block.height; ++row) {
    const uint8_t* p = bgra + static_cast<size_t>(row) * static_cast<size_t>(stride) + 4 * x;
    for (int col = 0; col < block.width; ++col, p += 4) {
      b += p[0];
      g += p[1];
      r += p[2];
      block.clipped += std::max({p[0], p[1], p[2]}) >= kClipLevel;
    }
  }
  const double n = static_cast<double>(block.width) * block.height;
  block.meanB = static_cast<float>(b / n);
  block.meanG = static_cast<float>(g / n);
  block.meanR = static_cast<float>(r / n);

  const float neutral = kNearWhiteRatio * block.meanY;
  block.candidate = block.meanY >= kMinLuma && block.clipped == 0 && block.avdCb <= kMaxAVD &&
                    block.avdCr <= kMaxAVD && std::fabs(block.meanCb) <= neutral &&
                    std::fabs(block.meanCr) <= neutral;
  return block;
}

bool AutoWhiteBalance::FindWhitePoint(const uint8_t* bgra, int stride) {
  blocks_.clear();
  if (!DescribesBuffer(bgra, width_, height_, stride)) return false;
  std::vector<WhitePointinfo*> candidates;
  for (int y = 0; y < height_; y += kBlockSize) {
    for (int x = 0; x < width_; x += kBlockSize) {
      blocks_.push_back(FindWhitePointBlock(bgra, stride, x, y));
    }
  }
  for (WhitePointinfo& block : blocks_) {
    if (block.candidate) candidates.push_back(&block);
  }
  if (candidates.empty()) return false;

  // Chroma per unit of brightness: the same for every grey under one cast.
  const auto relCb = [](const WhitePointinfo& block) { return block.meanCb / block.meanY; };
  const auto relCr = [](const WhitePointinfo& block) { return block.meanCr / block.meanY; };
  const float axisCb = WeightedMedian(candidates, relCb);
  const float axisCr = WeightedMedian(candidates, relCr);
  const auto distance = [&](const WhitePointinfo* block) {
    return std::max(std::fabs(relCb(*block) - axisCb), std::fabs(relCr(*block) - axisCr));
  };
  std::vector<WhitePointinfo*> near;
  for (WhitePointinfo* block : candidates) {
    block->nearWhite = distance(block) <= kClusterRadius;
    if (block->nearWhite) near.push_back(block);
  }
  if (near.empty()) {
    // The two medians can come from different blocks; then the closest block stands in.
    WhitePointinfo* closest =
        *std::min_element(candidates.begin(), candidates.end(),
                          [&](const WhitePointinfo* a, const WhitePointinfo* b) {
                            return distance(a) < distance(b);
                          });
    closest->nearWhite = true;
    near.push_back(closest);
  }

  // The brightest first; equal brightness keeps image order, so the choice is reproducible.
  std::stable_sort(near.begin(), near.end(), [](const WhitePointinfo* a, const WhitePointinfo* b) {
    return a->meanY > b->meanY;
  });
  const auto taken = std::max<size_t>(
      1, static_cast<size_t>(std::ceil(kBrightFraction * static_cast<float>(near.size()))));
  double b = 0, g = 0, r = 0, n = 0;
  for (size_t i = 0; i < taken; ++i) {
    const WhitePointinfo& block = *near[i];
    const double pixels = static_cast<double>(block.width) * block.height;
    b += block.meanB * pixels;
    g += block.meanG * pixels;
    r += block.meanR * pixels;
    n += pixels;
  }
  SetWhite(static_cast<float>(b / n), static_cast<float>(g / n), static_cast<float>(r / n));
  return true;
}

bool AutoWhiteBalance::AutoCalcGain(const uint8_t* bgra, int width, int height, int stride) {
  if (!BGR2YCbCr(bgra, width, height, stride)) return false;
  return FindWhitePoint(bgra, stride);
}

ColorGain AutoWhiteBalance::CalcGain(float b, float g, float r) {
  if (!(b > 0.0f && g > 0.0f && r > 0.0f)) return ColorGain{1.0f, 1.0f, 1.0f};
  return ColorGain{g / r, 1.0f, g / b};
}

void AutoWhiteBalance::SetWhite(float b, float g, float r) {
  white_ = BGRAColor{RoundToByte(b), RoundToByte(g), RoundToByte(r), 255};
  gain_ = CalcGain(b, g, r);
}

void AutoWhiteBalance::SetWhitePoint(const BGRAColor& white) {
  white_ = white;
  gain_ = CalcGain(white.b, white.g, white.r);
}

bool AutoWhiteBalance::SetWhitePointPos(const uint8_t* bgra, int width, int height, int stride,
                                        int x, int y, int radius) {
  if (!DescribesBuffer(bgra, width, height, stride) || x < 0 || y < 0 || x >= width ||
      y >= height) {
    return false;
  }
  // In 64 bits: x + radius and the pixel count of a large square pass INT_MAX.
  const int64_t reach = std::max(radius, 0);
  const int64_t x0 = std::max<int64_t>(x - reach, 0), x1 = std::min<int64_t>(x + reach, width - 1);
  const int64_t y0 = std::max<int64_t>(y - reach, 0), y1 = std::min<int64_t>(y + reach, height - 1);
  int64_t b = 0, g = 0, r = 0;
  for (int64_t row = y0; row <= y1; ++row) {
    const uint8_t* p = bgra + static_cast<size_t>(row) * static_cast<size_t>(stride) + 4 * x0;
    for (int64_t col = x0; col <= x1; ++col, p += 4) {
      b += p[0];
      g += p[1];
      r += p[2];
    }
  }
  const float n = static_cast<float>((x1 - x0 + 1) * (y1 - y0 + 1));
  SetWhite(static_cast<float>(b) / n, static_cast<float>(g) / n, static_cast<float>(r) / n);
  return true;
}

void AutoWhiteBalance::CalcAdjustPos(float* temperature, float* tint) const {
  // The effect's factors are 1 + 0.5 b + a, 1 - b, 1 + 0.5 b - a for red, green, blue: they
  // always sum to 3. Scaling the gains to that sum gives a and b directly.
  const float sum = gain_.r + gain_.g + gain_.b;
  const float scale = sum > 0.0f ? 3.0f / sum : 1.0f;
  const float a = scale * (gain_.r - gain_.b) / 2.0f;
  const float b = 1.0f - scale * gain_.g;
  if (temperature) *temperature = std::clamp(200.0f * a, -100.0f, 100.0f);
  if (tint) *tint = std::clamp(200.0f * b, -100.0f, 100.0f);
}

bool AutoWhiteBalance::Process(const uint8_t* src, uint8_t* dst, int width, int height,
                               int srcStride, int dstStride) const {
  if (!DescribesBuffer(src, width, height, srcStride) ||
      !DescribesBuffer(dst, width, height, dstStride)) {
    return false;
  }
  uint8_t blue[256], green[256], red[256];
  for (int v = 0; v < 256; ++v) {
    blue[v] = RoundToByte(static_cast<float>(v) * gain_.b);
    green[v] = RoundToByte(static_cast<float>(v) * gain_.g);
    red[v] = RoundToByte(static_cast<float>(v) * gain_.r);
  }
  for (int row = 0; row < height; ++row) {
    const uint8_t* s = src + static_cast<size_t>(row) * static_cast<size_t>(srcStride);
    uint8_t* d = dst + static_cast<size_t>(row) * static_cast<size_t>(dstStride);
    for (int x = 0; x < width; ++x, s += 4, d += 4) {
      const uint8_t pixel[4] = {blue[s[0]], green[s[1]], red[s[2]], s[3]};
      std::copy(pixel, pixel + 4, d);
    }
  }
  return true;
}
