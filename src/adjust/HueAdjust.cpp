// Hue rotation with the sequential 3 x 3 matrix, and the exact rotation for float colours.
//
// Packed 4-byte pixels go through the vector kernel of simd/hue_rotate_hwy.cpp, whose lanes
// evaluate the per-pixel rows below in the same order and precision.
#include "tessarofx/HueAdjust.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <mutex>

#include "image/ImageLayout.h"
#include "simd/hue_rotate.h"

float matrix[9] = {1, 0, 0, 0, 1, 0, 0, 0, 1};

namespace tfx {

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
    tfx::RotatePixels(bits, std::min(pixels, size / 4), m);
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
