// ColorAdjust: exposure, brightness, contrast, vibrance and saturation, in that order.
#include <cstring>
#include <memory>

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
    if (!dst || !src) return NLE_E_INVALIDARG;
    // Parameters go to the operations as floats, unscaled; an absent one is a no-op.
    using namespace tfx::catalog::color_adjust;
    const float settings[5] = {
        static_cast<float>(ParamDouble(kExposure)), static_cast<float>(ParamDouble(kBrightness)),
        static_cast<float>(ParamDouble(kContrast)), static_cast<float>(ParamDouble(kVibrance)),
        static_cast<float>(ParamDouble(kSaturation))};

    // Building the tables costs about a tenth of a 1080p pass, so it waits for a change of setting.
    if (!plan_ || std::memcmp(settings, planned_, sizeof settings) != 0) {
      plan_ =
          std::make_unique<tfx::ColorAdjustPlan>(settings[0], settings[1], settings[2], settings[3],
                                                 settings[4], tfx::BestColorAdjustRows());
      std::memcpy(planned_, settings, sizeof settings);
    }
    const tfx::ColorAdjustPlan& plan = *plan_;
    if (ForEachBand(dst, dstWidth, dstHeight, dstStride, src, srcHeight, srcStride,
                    [&](uint8_t* to, const uint8_t* from, int, int rows) {
                      // With nothing to do, the plan copies.
                      plan.ApplyInto(to, from, static_cast<size_t>(rows) * dstWidth);
                    })) {
      return 0;
    }

    // Never more rows than both frames hold: a foreground larger than the output is cut.
    myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcStride, dstStride);
    CxImage image(&dst, static_cast<unsigned>(dstWidth), static_cast<unsigned>(dstHeight), 32,
                  static_cast<unsigned>(dstStride), IPF_BGRA);
    tfx::ToneAdjust(&image, settings[0], settings[1], settings[2], tfx::BestColorAdjustRows());
    vibranceAdjustment(&image, settings[3]);
    saturationAdjustment(&image, settings[4]);
    return 0;
  }

 private:
  std::unique_ptr<tfx::ColorAdjustPlan> plan_;
  float planned_[5] = {};
};

const NLEColorAdjustEffect::_auto_register s_register(tfx::catalog::kColorAdjust.wideGuid,
                                                      L"ColorAdjust",
                                                      &NLEColorAdjustEffect::create);

}  // namespace
