#include "adjust/ColorAdjustReference.h"

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstdint>
#include <cstring>

namespace tfx_test {
namespace {

template <class Fn>
void EveryPixel(CxImage* image, Fn fn) {
  for (unsigned long y = 0; y < image->GetHeight(); ++y) {
    for (unsigned long x = 0; x < image->GetWidth(); ++x) {
      tagRGBQUAD c = image->GetPixelColor(x, y, true);
      uint8_t* channels[3] = {&c.rgbBlue, &c.rgbGreen, &c.rgbRed};
      fn(channels);
      image->SetPixelColor(x, y, c);
    }
  }
}

uint8_t FloorAndCap(float v) {
  if (v < 0) return 0;
  return static_cast<uint8_t>(static_cast<int>(std::min(255.0f, v)));
}

}  // namespace

void ReferenceExposure(CxImage* image, float e) {
  if (e == 0) return;
  const float gain = static_cast<float>(std::pow(2.0, e / 50.0 * 0.6));
  EveryPixel(image, [&](uint8_t* const* ch) {
    for (int i = 0; i < 3; ++i) {
      *ch[i] = static_cast<uint8_t>(static_cast<int>(std::min(255.0f, *ch[i] * gain)));
    }
  });
}

void ReferenceBrightness(CxImage* image, float b) {
  if (b == 0) return;
  float k;
  if (b > 0) {
    k = b / 100.0f + 1.0f;
  } else {
    k = static_cast<float>((1.0 / (b / 253.0 + 0.99) - 1.0) * (-255.0) * 0.6);
  }
  uint8_t* p = image->GetBits();
  const size_t step = image->GetBpp() / 8;
  for (size_t i = 0; i < size_t{image->GetWidth()} * image->GetHeight(); ++i, p += step) {
    for (int j = 0; j < 3; ++j) p[j] = FloorAndCap(k > 0 ? p[j] * k : p[j] + k);
  }
}

void ReferenceContrast(CxImage* image, float c) {
  if (c == 0) return;
  const float t = c > 0 ? 1.0f / (1.0f - c / 255.0f) - 1.0f : c / 255.0f;
  // Outside int's range (t is infinite at c = 255) the conversion gives INT_MIN, as the x86
  // truncating instruction does.
  const float scaled = t * 100.0f * 0.5f;
  int lo = scaled >= -2147483648.0f && scaled < 2147483648.0f ? static_cast<int>(scaled) : INT_MIN;
  int hi = 0;  // 255 minus the unclamped lo is not used once lo is clamped below
  if (255 - int64_t{lo} < lo) {
    lo = 120;
    hi = 127;
  } else if (lo < -127) {
    lo = -120;
  } else {
    hi = 255 - lo;
  }
  const int d = lo < 0 ? 255 + 2 * lo : 255 - 2 * lo;
  EveryPixel(image, [&](uint8_t* const* ch) {
    for (int i = 0; i < 3; ++i) {
      const int v = *ch[i];
      if (lo < 1) {
        *ch[i] = static_cast<uint8_t>(v * d / 255 - lo);
      } else if (v <= lo) {
        *ch[i] = 0;
      } else if (v > hi) {
        *ch[i] = 255;
      } else {
        *ch[i] = static_cast<uint8_t>((v - lo) * 255 / d);
      }
    }
  });
}

void ReferenceVibrance(CxImage* image, float v) {
  if (v == 0) return;
  const float strength = static_cast<float>(v / 100.0f * 0.8);
  EveryPixel(image, [&](uint8_t* const* ch) {
    const int luma = (std::min({*ch[0], *ch[1], *ch[2]}) + std::max({*ch[0], *ch[1], *ch[2]})) >> 1;
    int mask[3];
    for (int i = 0; i < 3; ++i) mask[i] = std::clamp(*ch[i] - luma, 0, 255);
    const int maskLuma =
        (std::min({mask[0], mask[1], mask[2]}) + std::max({mask[0], mask[1], mask[2]})) >> 1;
    const uint8_t amount = static_cast<uint8_t>(-maskLuma);
    const int k = static_cast<int>(amount * strength);
    for (int i = 0; i < 3; ++i) {
      *ch[i] = static_cast<uint8_t>(std::clamp((*ch[i] * (k + 256) - luma * k) >> 8, 0, 255));
    }
  });
}

void ReferenceSaturation(CxImage* image, float s) {
  if (s == 0) return;
  const float sigma = s / 100.0f;
  EveryPixel(image, [&](uint8_t* const* ch) {
    const int mx = std::max({*ch[0], *ch[1], *ch[2]});
    const int mn = std::min({*ch[0], *ch[1], *ch[2]});
    if (mx == mn) return;
    const float sum = (mx + mn) / 255.0f;
    const float l = sum / 2;
    const float delta = (mx - mn) / 255.0f;
    const float lv = l * 255;
    for (int i = 0; i < 3; ++i) {
      const float c = *ch[i];
      float out;
      if (sigma >= 0) {
        const float sat = l < 0.5f ? delta / sum : delta / (2 - sum);
        const float a = sat + sigma >= 1 ? 1 / sat - 1 : 1 / (1 - sigma) - 1;
        out = c + (c - lv) * a;
      } else {
        out = lv + (c - lv) * (1 + sigma);
      }
      *ch[i] = FloorAndCap(out);
    }
  });
}

}  // namespace tfx_test
