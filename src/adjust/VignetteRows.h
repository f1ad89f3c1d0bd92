// The vignette blend on rows of 32-bit BGRA pixels, for the image function and for tests that
// hold it against vignettePixel on every kernel the machine runs.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace tfx {

struct VignetteBlend;

// One compilation of the per-pixel blend: the same source built for a baseline CPU and, where the
// CPU has it, for AVX2 (twice the lanes). Both evaluate the same expressions, without fused
// multiply-add, so they give the same bytes.
struct VignetteKernel {
  const char* name;
  void (*blendRun)(uint8_t* bgra, const float* mask, size_t count, const VignetteBlend& blend);
};

// The kernels this machine runs, best first.
const std::vector<const VignetteKernel*>& SupportedVignetteKernels();

// What one call derives from its arguments: the blend constants, the kernel, and per-channel
// tables for the mask weights where the three channels do not interact.
struct VignetteBlend {
  float a;
  float e;
  float b;
  const VignetteKernel* kernel;
  uint8_t inside[256];  // g = 1: each channel times e alone
  bool outsideByTable;  // g = 0 with a zero tone-curve weight
  uint8_t outside[256];
};

VignetteBlend MakeVignetteBlend(float a, float e, float b,
                                const VignetteKernel& kernel = *SupportedVignetteKernels().front());

// Blends `count` BGRA pixels with their mask weights; the same bytes as vignettePixel.
void VignetteRow(uint8_t* bgra, const float* mask, size_t count, const VignetteBlend& blend);

}  // namespace tfx
