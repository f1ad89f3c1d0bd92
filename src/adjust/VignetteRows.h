// The vignette blend on rows of 32-bit BGRA pixels, for the image function and for tests that
// hold it against vignettePixel on every kernel the machine runs.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace tfx {

struct VignetteBlend;

// One compilation of the per-pixel blend per instruction set; all evaluate the same expressions,
// without fused multiply-add, so they give the same bytes.
struct VignetteKernel {
  const char* name;
  // From `src` into `dst`, which may be `src`.
  void (*blendRun)(uint8_t* dst, const uint8_t* src, const float* mask, size_t count,
                   const VignetteBlend& blend);
};

// The kernel Highway's dispatch picks at the time of the call (hwy::SetSupportedTargetsForTest
// included).
const VignetteKernel& BestVignetteKernel();

struct ColorAdjustRows;

// What one call derives from its arguments: the blend constants, the kernels, and per-channel
// tables for the mask weights where the three channels do not interact.
struct VignetteBlend {
  float a;
  float e;
  float b;
  const VignetteKernel* kernel;
  const ColorAdjustRows* tables;  // for the runs that go through a table
  uint8_t inside[256];            // g = 1: each channel times e alone
  bool insideUnchanged;           // that table is the identity (no exposure)
  bool outsideByTable;            // g = 0 with a zero tone-curve weight
  // b = 0 and every scaled channel finite: the curve's weight is a signed zero for every g, and
  // w * v = 0 exactly.
  bool zeroWeight;
  uint8_t outside[256];
};

// With the kernels Highway's dispatch picks now.
VignetteBlend MakeVignetteBlend(float a, float e, float b);

// Blends `count` BGRA pixels with their mask weights (in [0, 1], as the gradient makes them); the
// same bytes as vignettePixel.
void VignetteRow(uint8_t* bgra, const float* mask, size_t count, const VignetteBlend& blend);

enum class RunKind : uint8_t { kInside, kOutside, kBlend };

// vignetteAdjustFilter's work on BGRA frames of one size and one setting, made ready once: per
// row of the mask's quadrant, the runs of pixels that each table takes and those blended one by
// one, with the weights of the latter.
class VignettePlan {
 public:
  // vignetteAdjustFilter's arguments, in its order; nothing to do where it would do nothing, or
  // where memory runs out.
  VignettePlan(int width, int height, float amount, float feather, float highlights, float size,
               float roundness, float exposure);
  // Rows [y0, y0 + rows) of a frame of the plan's size, the first at `pixels`.
  void Apply(uint8_t* pixels, size_t stride, int y0, int rows) const {
    ApplyInto(pixels, pixels, stride, y0, rows);
  }
  // The same from the rows of `src` (same stride) into `dst`, which may be `src`: what copying
  // them and then Apply would give.
  void ApplyInto(uint8_t* dst, const uint8_t* src, size_t stride, int y0, int rows) const;

 private:
  struct Run {
    RunKind kind;
    size_t start, end;
    size_t mask;  // into masks_, for blended runs
  };
  int height_;
  bool active_ = false;
  VignetteBlend blend_ = {};
  std::vector<size_t> firstRun_;  // per quadrant row, and one past the last
  std::vector<Run> runs_;
  std::vector<float> masks_;
};

}  // namespace tfx
