// Hue rotation with the sequential 3 x 3 matrix, and the exact rotation for float colours.
//
// Packed 4-byte pixels go through a vector kernel, compiled once per instruction set by
// foreach_target.h and picked at run time; its lanes evaluate the per-pixel rows below in the
// same order and precision (no MulAdd; the build passes -ffp-contract=off), so every set gives
// the same bytes.
#ifndef TFX_ADJUST_HUEADJUST_SHARED
#define TFX_ADJUST_HUEADJUST_SHARED

#include "tessarofx/HueAdjust.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <mutex>

#include "image/ImageLayout.h"

#endif  // TFX_ADJUST_HUEADJUST_SHARED

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "adjust/HueAdjust.cpp"
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

using DU = hn::ScalableTag<uint32_t>;
using DI = hn::RebindToSigned<DU>;
using DF = hn::RebindToFloat<DU>;
using VU = hn::Vec<DU>;
using VF = hn::Vec<DF>;

// The stored byte as a float: limited to 0..255, then truncated (Trunc gives the integer's
// float exactly).
HWY_INLINE VF StoreLane(VF v) {
  const DF df;
  return hn::Trunc(hn::Min(hn::Set(df, 255.0f), hn::Max(hn::Zero(df), v)));
}

HWY_INLINE VU RotateLanes(VU px, const float m[9]) {
  const DU du;
  const DI di;
  const DF df;
  const VU byte = hn::Set(du, 255u);
  const VU u0 = hn::And(px, byte);
  const VU u1 = hn::And(hn::ShiftRight<8>(px), byte);
  const VU u2 = hn::And(hn::ShiftRight<16>(px), byte);
  const auto grey = hn::And(hn::Eq(u0, u1), hn::Eq(u1, u2));
  const VF b0 = hn::ConvertTo(df, hn::BitCast(di, u0));
  const VF b1 = hn::ConvertTo(df, hn::BitCast(di, u1));
  const VF b2 = hn::ConvertTo(df, hn::BitCast(di, u2));
  const auto row = [&](int i, VF x, VF y, VF z) {
    const VF sum =
        hn::Add(hn::Add(hn::Mul(hn::Set(df, m[i]), x), hn::Mul(hn::Set(df, m[i + 1]), y)),
                hn::Mul(hn::Set(df, m[i + 2]), z));
    return StoreLane(sum);
  };
  const VF n0 = row(0, b0, b1, b2);
  const VF n1 = row(3, n0, b1, b2);
  const VF n2 = row(6, n0, n1, b2);
  // A whole number 0..255 plus 2^23 is exact and holds the byte in its low mantissa bits, under
  // exponent bits that the shifts by 8 and 16 push out of the lane: cheaper than ConvertTo, whose
  // overflow fix-up these values never need.
  const auto bits = [&](VF v) { return hn::BitCast(du, hn::Add(v, hn::Set(df, 8388608.0f))); };
  const VU out = hn::Or(hn::Or(hn::And(px, hn::Set(du, 0xff000000u)), hn::And(bits(n0), byte)),
                        hn::Or(hn::ShiftLeft<8>(bits(n1)), hn::ShiftLeft<16>(bits(n2))));
  return hn::IfThenElse(grey, px, out);
}

// `count` consecutive 4-byte pixels.
void RotatePixels(uint8_t* pixels, size_t count, const float* m) {
  const DU du;
  const size_t lanes = hn::Lanes(du);
  size_t i = 0;
  for (; i + lanes <= count; i += lanes) {
    uint32_t* p = reinterpret_cast<uint32_t*>(pixels + 4 * i);
    // A frame far beyond the caches streams in faster when asked for well ahead of use.
    __builtin_prefetch(pixels + 4 * i + 4096, 1);
    hn::StoreU(RotateLanes(hn::LoadU(du, p), m), du, p);
  }
  if (i < count) {
    // The tail through a full vector, so that it sees the very same operations.
    alignas(64) uint32_t tail[HWY_MAX_BYTES / 4] = {};
    std::memcpy(tail, pixels + 4 * i, 4 * (count - i));
    hn::Store(RotateLanes(hn::Load(du, tail), m), du, tail);
    std::memcpy(pixels + 4 * i, tail, 4 * (count - i));
  }
}

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

float matrix[9] = {1, 0, 0, 0, 1, 0, 0, 0, 1};

namespace tfx {

HWY_EXPORT(RotatePixels);

namespace {

constexpr double kPi = 3.14159265358979323846;

// Guards writes of `matrix` only: the image work never reads it, so two rotations never wait on
// each other for longer than nine stores.
std::mutex& MatrixLock() {
  static std::mutex lock;
  return lock;
}

// The entries in double, each stored as float; the constant is sqrt(1/3) rounded to float.
void HueMatrix(float angle, float m[9]) {
  const double a = static_cast<double>(angle) * kPi / 180.0;
  const double c = std::cos(a);
  const double s = std::sin(a);
  const double k = static_cast<double>(0.57735026f);
  const float m0 = static_cast<float>((1.0 - c) / 3.0 + c);
  const float m1 = static_cast<float>((1.0 - c) / 3.0 - k * s);
  const float m2 = static_cast<float>((1.0 - c) / 3.0 + k * s);
  const float rows[9] = {m0, m1, m2, m2, m0, m1, m1, m2, m0};
  std::memcpy(m, rows, sizeof(rows));
}

void Publish(const float m[9]) {
  std::lock_guard<std::mutex> guard(MatrixLock());
  std::memcpy(matrix, m, sizeof(matrix));
}

// Finite angles give entries within [-1/3, 1] and sums of three bytes within about +-600, so
// the conversion below never sees NaN or an out-of-range value.
uint8_t StoreByte(float v) {
  return static_cast<uint8_t>(static_cast<int>(std::min(255.0f, std::max(0.0f, v))));
}

// Bytes 0..2 of one window, each row using the bytes the previous rows already stored. Equal
// bytes are a grey, which the rotation fixes; without this check float rounding of rows that sum
// to 1 truncates most greys one level down at almost every angle.
void RotateWindow(uint8_t* p, const float m[9]) {
  if (p[0] == p[1] && p[1] == p[2]) return;
  const float b1 = p[1];
  const float b2 = p[2];
  const uint8_t n0 = StoreByte(m[0] * static_cast<float>(p[0]) + m[1] * b1 + m[2] * b2);
  const uint8_t n1 = StoreByte(m[3] * static_cast<float>(n0) + m[4] * b1 + m[5] * b2);
  const uint8_t n2 =
      StoreByte(m[6] * static_cast<float>(n0) + m[7] * static_cast<float>(n1) + m[8] * b2);
  p[0] = n0;
  p[1] = n1;
  p[2] = n2;
}

}  // namespace
}  // namespace tfx

void calculateHueMartrix(float angle) {
  float m[9];
  tfx::HueMatrix(angle, m);
  tfx::Publish(m);
}

CxImage* hueAdjustment(CxImage* image, float angle) {
  if (!tfx::IsSoundImage(image) || angle == 0.0f || !std::isfinite(angle)) return image;
  float m[9];
  tfx::HueMatrix(angle, m);
  tfx::Publish(m);

  uint8_t* bits = image->GetBits();
  const size_t pixels = size_t{image->GetWidth()} * image->GetHeight();
  const size_t step = image->GetBpp() / 8;
  const size_t size = image->GetSize();
  if (step == 4) {
    // Row padding is ignored on purpose: width * height pixels from the first byte.
    HWY_DYNAMIC_DISPATCH(tfx::RotatePixels)(bits, std::min(pixels, size / 4), m);
    return image;
  }
  for (size_t i = 0, offset = 0; step != 0 && i < pixels && offset + 3 <= size;
       ++i, offset += step) {
    tfx::RotateWindow(bits + offset, m);
  }
  return image;
}

tagRGBQUAD transformHue1(tagRGBQUAD c, float angle) {
  if (angle == 0.0f || !std::isfinite(angle)) return c;
  float m[9];
  tfx::HueMatrix(angle, m);
  uint8_t p[3] = {c.rgbBlue, c.rgbGreen, c.rgbRed};
  tfx::RotateWindow(p, m);
  c.rgbBlue = p[0];
  c.rgbGreen = p[1];
  c.rgbRed = p[2];
  return c;
}

_rgb transformHue2(_rgb c, float angle) {
  if (!std::isfinite(angle)) return c;
  const double r = c.r, g = c.g, b = c.b;
  const double grey = (r + g + b) / 3.0;
  const double x = (2.0 * r - g - b) / std::sqrt(6.0);
  const double y = (g - b) / std::sqrt(2.0);
  const double radius = std::hypot(x, y);
  const double hue = std::atan2(y, x) - static_cast<double>(angle) * tfx::kPi / 180.0;
  const double u = radius * std::cos(hue) / std::sqrt(6.0);
  const double v = radius * std::sin(hue) / std::sqrt(2.0);
  return _rgb{static_cast<float>(grey + 2.0 * u), static_cast<float>(grey - u + v),
              static_cast<float>(grey - u - v)};
}
#endif  // HWY_ONCE
