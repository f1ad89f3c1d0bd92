// HSLAdjust: per-colour hue, saturation and lightness in eight bands.
#include "plugin/NLEDynamicEffect.h"
#include "simd/hsl_adjust_rows.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/HSLAdjust.h"

namespace {

static_assert(kHSLBandCount == tfx::catalog::hsl::kBands);

class NLEHSLAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEHSLAdjustEffect(); }

  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int dstStride, const uint8_t*, int, int,
                int, const uint8_t* src, int srcWidth, int srcHeight, int srcStride) override {
    if (!dst || !src) return NLE_E_INVALIDARG;
    HSLBands bands{};
    for (int b = 0; b < kHSLBandCount; ++b) {
      float* values[5] = {&bands.band[b].hue, &bands.band[b].sat, &bands.band[b].light,
                          &bands.band[b].width, &bands.band[b].soft};
      for (int v = 0; v < 5; ++v) {
        *values[v] = static_cast<float>(ParamDouble(tfx::catalog::hsl::Value(b, v)));
      }
    }

    // Packed frames alike go straight from the foreground into the output, without a copy.
    if (dstWidth > 0 && dstHeight > 0 && srcStride == dstStride &&
        static_cast<int64_t>(dstStride) == int64_t{dstWidth} * 4 && srcHeight >= dstHeight) {
      tfx::HslAdjustInto(dst, src, static_cast<size_t>(dstWidth) * static_cast<size_t>(dstHeight),
                         bands);
      return 0;
    }

    // Never more rows than both frames hold: a foreground larger than the output is cut.
    myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcStride, dstStride);
    CxImage image(&dst, static_cast<unsigned>(dstWidth), static_cast<unsigned>(dstHeight), 32,
                  static_cast<unsigned>(dstStride), IPF_BGRA);
    hslAdjustment(&image, bands);
    return 0;
  }
};

const NLEHSLAdjustEffect::_auto_register s_register(tfx::catalog::kHslAdjust.wideGuid, L"HSLAdjust",
                                                    &NLEHSLAdjustEffect::create);

}  // namespace
