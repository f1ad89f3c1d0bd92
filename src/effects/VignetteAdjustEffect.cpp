// VignetteAdjust: darkens or lightens the frame outside a centred ellipse and sets the exposure
// inside it.
#include "plugin/NLEDynamicEffect.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/Vignette.h"

namespace {

class NLEVignetteAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEVignetteAdjustEffect(); }

  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int dstStride, const uint8_t*, int, int,
                int, const uint8_t* src, int srcWidth, int srcHeight, int srcStride) override {
    if (!dst || !src) return NLE_E_INVALIDARG;
    // Percent values, passed on as floats; an absent one takes the neutral setting of the
    // effect's controls (a full-size, half-feathered ellipse with neutral highlights).
    using namespace tfx::catalog::vignette;
    const float amount = static_cast<float>(ParamDouble(kAmount));
    const float size = static_cast<float>(ParamDouble(kSize));
    const float roundness = static_cast<float>(ParamDouble(kRoundness));
    const float feather = static_cast<float>(ParamDouble(kFeather));
    const float exposure = static_cast<float>(ParamDouble(kExposure));
    const float highlights = static_cast<float>(ParamDouble(kHighlights));

    // Never more rows than both frames hold: a foreground larger than the output is cut.
    myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcStride, dstStride);
    CxImage image(&dst, static_cast<unsigned>(dstWidth), static_cast<unsigned>(dstHeight), 32,
                  static_cast<unsigned>(dstStride), IPF_BGRA);
    vignetteAdjustFilter(&image, amount, feather, highlights, size, roundness, exposure);
    return 0;
  }
};

const NLEVignetteAdjustEffect::_auto_register s_register(tfx::catalog::kVignette.wideGuid,
                                                         L"VignetteAdjust",
                                                         &NLEVignetteAdjustEffect::create);

}  // namespace
