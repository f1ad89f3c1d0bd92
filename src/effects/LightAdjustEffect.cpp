// LightAdjust: highlights, shadows, white and black levels, in that order.
#include <cstring>
#include <memory>

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
    const float strengths[4] = {static_cast<float>(ParamDouble(tfx::catalog::light::kHighlight)),
                                static_cast<float>(ParamDouble(tfx::catalog::light::kShadow)),
                                static_cast<float>(ParamDouble(tfx::catalog::light::kWhiteLevel)),
                                static_cast<float>(ParamDouble(tfx::catalog::light::kBlackLevel))};

    // The tables take longer to build than a small frame takes to run, and settings seldom
    // change from frame to frame.
    if (!plan_ || std::memcmp(strengths, planned_, sizeof strengths) != 0) {
      plan_ = std::make_unique<tfx::LightAdjustPlan>(strengths[0], strengths[1], strengths[2],
                                                     strengths[3]);
      std::memcpy(planned_, strengths, sizeof strengths);
    }
    const tfx::LightAdjustPlan& plan = *plan_;
    // An effect with nothing to do still passes its input through.
    const bool copy = plan.Empty();
    if (ForEachBand(dst, dstWidth, dstHeight, dstStride, src, srcHeight, srcStride,
                    [&](uint8_t* to, const uint8_t* from, int, int rows) {
                      const size_t count = static_cast<size_t>(rows) * dstWidth;
                      if (copy) {
                        if (to != from) std::memcpy(to, from, count * 4);
                      } else {
                        plan.ApplyInto(to, from, count);
                      }
                    })) {
      return 0;
    }
    // Never more rows than both frames hold: a foreground larger than the output is cut.
    myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcStride, dstStride);
    CxImage image(&dst, static_cast<unsigned>(dstWidth), static_cast<unsigned>(dstHeight), 32,
                  static_cast<unsigned>(dstStride), IPF_BGRA);
    tfx::LightAdjust(&image, strengths[0], strengths[1], strengths[2], strengths[3]);
    return 0;
  }

 private:
  std::unique_ptr<tfx::LightAdjustPlan> plan_;
  float planned_[4] = {};
};

const NLELightAdjustEffect::_auto_register s_register(tfx::catalog::kLightAdjust.wideGuid,
                                                      L"LightAdjust",
                                                      &NLELightAdjustEffect::create);

}  // namespace
