// VignetteAdjust: darkens or lightens the frame outside a centred ellipse and sets the exposure
// inside it.
#include <cstring>
#include <memory>

#include "adjust/VignetteRows.h"
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
    // effect's controls (a full-size, half-feathered ellipse with neutral highlights). In the
    // order vignetteAdjustFilter takes them.
    using namespace tfx::catalog::vignette;
    const float settings[6] = {
        static_cast<float>(ParamDouble(kAmount)),     static_cast<float>(ParamDouble(kFeather)),
        static_cast<float>(ParamDouble(kHighlights)), static_cast<float>(ParamDouble(kSize)),
        static_cast<float>(ParamDouble(kRoundness)),  static_cast<float>(ParamDouble(kExposure))};

    // The mask costs more than the blend; it is kept while the frame size and settings stay.
    if (!plan_ || dstWidth != plannedWidth_ || dstHeight != plannedHeight_ ||
        std::memcmp(settings, planned_, sizeof settings) != 0) {
      plan_ =
          std::make_unique<tfx::VignettePlan>(dstWidth, dstHeight, settings[0], settings[1],
                                              settings[2], settings[3], settings[4], settings[5]);
      plannedWidth_ = dstWidth;
      plannedHeight_ = dstHeight;
      std::memcpy(planned_, settings, sizeof settings);
    }
    const tfx::VignettePlan& plan = *plan_;
    if (ForEachBand(dst, dstWidth, dstHeight, dstStride, src, srcHeight, srcStride,
                    [&](uint8_t* to, const uint8_t* from, int y0, int rows) {
                      plan.ApplyInto(to, from, static_cast<size_t>(dstStride), y0, rows);
                    })) {
      return 0;
    }

    // Never more rows than both frames hold: a foreground larger than the output is cut.
    myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcStride, dstStride);
    CxImage image(&dst, static_cast<unsigned>(dstWidth), static_cast<unsigned>(dstHeight), 32,
                  static_cast<unsigned>(dstStride), IPF_BGRA);
    vignetteAdjustFilter(&image, settings[0], settings[1], settings[2], settings[3], settings[4],
                         settings[5]);
    return 0;
  }

 private:
  std::unique_ptr<tfx::VignettePlan> plan_;
  int plannedWidth_ = 0, plannedHeight_ = 0;
  float planned_[6] = {};
};

const NLEVignetteAdjustEffect::_auto_register s_register(tfx::catalog::kVignette.wideGuid,
                                                         L"VignetteAdjust",
                                                         &NLEVignetteAdjustEffect::create);

}  // namespace
