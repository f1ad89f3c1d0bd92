// The local-statistics denoiser: each pixel is pulled towards its window mean by as much as the
// window's variance is small next to the noise.
#include <cstdint>
#include <memory>
#include <new>

#include "tessarofx/Blur.h"
#include "tessarofx/Denoise.h"

namespace {

// k = v / (v + noise) for every variance byte v, in float. A flat window without noise (0 / 0)
// takes the mean.
void Weights(float noise, float k[256]) {
  for (int v = 0; v < 256; ++v) {
    const float variance = static_cast<float>(v);
    const float sum = variance + noise;
    k[v] = v == 0 && sum == 0.0f ? 0.0f : variance / sum;
  }
}

// p k + m (1 - k) in float and in that order, truncated into 0..255; a NaN (a negative noise
// that cancels the variance) stores 255.
uint8_t Pull(uint8_t pixel, uint8_t mean, float k) {
  const float value = static_cast<float>(pixel) * k + static_cast<float>(mean) * (1.0f - k);
  if (value < 0.0f) return 0;
  return value < 255.0f ? static_cast<uint8_t>(value) : 255;
}

}  // namespace

void channelDenoise(unsigned char* plane, int width, int height, int windowSize, float noise) {
  if (!plane || width < 1 || height < 1 || windowSize < 1) return;
  // The window filters refuse planes over 2^31 - 1 bytes and would leave the statistics unset.
  const uint64_t area = static_cast<uint64_t>(width) * static_cast<uint64_t>(height);
  if (area > INT32_MAX) return;
  const int radius = (windowSize - 1) / 2;
  const std::unique_ptr<uint8_t[]> mean(new (std::nothrow) uint8_t[area]);
  const std::unique_ptr<uint8_t[]> variance(new (std::nothrow) uint8_t[area]);
  if (!mean || !variance) return;
  fastWindowAverageFilter(plane, mean.get(), width, height, radius);
  fastWindowVarianceFilter(plane, variance.get(), width, height, radius);
  float k[256];
  Weights(noise, k);
  for (uint64_t i = 0; i < area; ++i) plane[i] = Pull(plane[i], mean[i], k[variance[i]]);
}
