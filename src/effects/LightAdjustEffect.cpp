// LightAdjust: highlights, shadows, white and black levels, in that order.
#include "adjust/LightAdjustTables.h"
#include "plugin/NLEDynamicEffect.h"
#include "tessarofx/CxImage.h"

namespace {

class NLELightAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLELightAdjustEffect(); }

  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int dstStride, const uint8_t*, int, int,
                int, const uint8_t* src, int srcWidth, int srcHeight, int srcStride) override {
    if (!dst || !src) return NLE_E_INVALIDARG;
    // Parameters go to the operations as floats, unscaled; an absent one is a no-op.
    const float highlight = static_cast<float>(ParamDouble(tfx::catalog::light::kHighlight));
    const float shadow = static_cast<float>(ParamDouble(tfx::catalog::light::kShadow));
    const float whiteLevel = static_cast<float>(ParamDouble(tfx::catalog::light::kWhiteLevel));
    const float blackLevel = static_cast<float>(ParamDouble(tfx::catalog::light::kBlackLevel));

    // Never more rows than both frames hold: a foreground larger than the output is cut.
    myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcStride, dstStride);
    CxImage image(&dst, static_cast<unsigned>(dstWidth), static_cast<unsigned>(dstHeight), 32,
                  static_cast<unsigned>(dstStride), IPF_BGRA);
    tfx::LightAdjust(&image, highlight, shadow, whiteLevel, blackLevel);
    return 0;
  }
};

const NLELightAdjustEffect::_auto_register s_register(tfx::catalog::kLightAdjust.wideGuid,
                                                      L"LightAdjust",
                                                      &NLELightAdjustEffect::create);

}  // namespace
