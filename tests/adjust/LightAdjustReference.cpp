#include "adjust/LightAdjustReference.h"

#include <algorithm>
#include <cstdint>

namespace tfx_test {
namespace {

float Enhance(float ch, float k) { return 255.0f - (255.0f - ch) * (255.0f - k * ch) / 255.0f; }

// fn(channel, M) gives the new channel.
template <class Fn>
void EveryPixel(CxImage* image, Fn fn) {
  for (unsigned long y = 0; y < image->GetHeight(); ++y) {
    for (unsigned long x = 0; x < image->GetWidth(); ++x) {
      tagRGBQUAD c = image->GetPixelColor(x, y, true);
      const float m = std::max({c.rgbRed, c.rgbGreen, c.rgbBlue}) / 255.0f;
      c.rgbBlue = fn(c.rgbBlue, m);
      c.rgbGreen = fn(c.rgbGreen, m);
      c.rgbRed = fn(c.rgbRed, m);
      image->SetPixelColor(x, y, c);
    }
  }
}

uint8_t Wrapped(float v) { return static_cast<uint8_t>(static_cast<int>(v)); }

uint8_t Clamped(float v) { return static_cast<uint8_t>(std::clamp(static_cast<int>(v), 0, 255)); }

}  // namespace

void ReferenceHighlight(CxImage* image, float h) {
  if (h == 0) return;
  EveryPixel(image, [&](uint8_t ch, float m) { return Wrapped(Enhance(ch, m * (h / 100.0f))); });
}

void ReferenceShadow(CxImage* image, float s) {
  if (s == 0) return;
  const float f = static_cast<float>(s / 100.0f * (s > 0 ? 2.0 : 0.5));
  EveryPixel(image, [&](uint8_t ch, float m) { return Wrapped(Enhance(ch, (1 - m) * f)); });
}

void ReferenceWhiteLevel(CxImage* image, float w) {
  if (w == 0) return;
  EveryPixel(image, [&](uint8_t ch, float m) {
    const float k = m * (w / 100.0f);
    float t = Enhance(ch, k);
    if (k > 0) t = Enhance(t, k);
    return Clamped(t);
  });
}

void ReferenceBlackLevel(CxImage* image, float k0) {
  if (k0 == 0) return;
  const float f = static_cast<float>(k0 / 100.0f * (k0 > 0 ? 0.5 : 2.0));
  EveryPixel(image, [&](uint8_t ch, float m) { return Clamped(Enhance(ch, (1 - m) * f)); });
}

}  // namespace tfx_test
