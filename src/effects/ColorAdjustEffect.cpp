// ColorAdjust: exposure, brightness, contrast, vibrance and saturation, in that order.
#include "adjust/ColorAdjustRows.h"
#include "plugin/NLEDynamicEffect.h"
#include "tessarofx/ColorAdjust.h"
#include "tessarofx/CxImage.h"

namespace {

class NLEColorAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEColorAdjustEffect(); }

  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int dstStride, const uint8_t*, int, int,
                int, const uint8_t* src, int srcWidth, int srcHeight, int srcStride) override {
    (void)srcWidth;
    if (!dst || !src) return NLE_E_INVALIDARG;
    // Parameters go to the operations as floats, unscaled; an absent one is a no-op.
    using namespace tfx::catalog::color_adjust;
    const float exposure = static_cast<float>(ParamDouble(kExposure));
    const float brightness = static_cast<float>(ParamDouble(kBrightness));
    const float contrast = static_cast<float>(ParamDouble(kContrast));
    const float vibrance = static_cast<float>(ParamDouble(kVibrance));
    const float saturation = static_cast<float>(ParamDouble(kSaturation));

    // Never more rows than both frames hold: a foreground larger than the output is cut.
    myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcStride, dstStride);
    CxImage image(&dst, static_cast<unsigned>(dstWidth), static_cast<unsigned>(dstHeight), 32,
                  static_cast<unsigned>(dstStride), IPF_BGRA);
    tfx::ToneAdjust(&image, exposure, brightness, contrast, tfx::BestColorAdjustRows());
    vibranceAdjustment(&image, vibrance);
    saturationAdjustment(&image, saturation);
    return 0;
  }
};

const NLEColorAdjustEffect::_auto_register s_register(tfx::catalog::kColorAdjust.wideGuid,
                                                      L"ColorAdjust",
                                                      &NLEColorAdjustEffect::create);

}  // namespace
