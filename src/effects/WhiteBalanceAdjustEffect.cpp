// WhiteBalanceAdjust: temperature, tint and per-channel gains.
#include <opencv2/core.hpp>

#include "effects/EffectParams.h"
#include "plugin/NLEDynamicEffect.h"
#include "tessarofx/WhiteBalance.h"

namespace {

class NLEWhiteBalanceAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEWhiteBalanceAdjustEffect(); }

  // Reads the foreground and writes every destination byte itself, so there is no copy step.
  // Both frames are taken as packed rows of width * 4 bytes, which is how the pipeline hands
  // them over.
  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int, const uint8_t*, int, int, int,
                const uint8_t* src, int srcWidth, int srcHeight, int) override {
    if (!dst || !src) return NLE_E_INVALIDARG;
    using namespace tfx::catalog::white_balance;
    const double temperature = ParamDouble(kTemperature);
    const double tint = ParamDouble(kTint);
    const ColorGain gain{static_cast<float>(ParamDouble(kRedGain)),
                         static_cast<float>(ParamDouble(kGreenGain)),
                         static_cast<float>(ParamDouble(kBlueGain))};
    if (dstWidth <= 0 || dstHeight <= 0 || srcWidth <= 0 || srcHeight <= 0) return 0;
    cv::Mat in(srcHeight, srcWidth, CV_8UC4, const_cast<uint8_t*>(src));
    cv::Mat out(dstHeight, dstWidth, CV_8UC4, dst);
    balance_.Process(in, out, gain, static_cast<float>(temperature / 200.0),
                     static_cast<float>(tint / 200.0));
    return 0;
  }

 private:
  AdjustWhiteBalance balance_;
};

const NLEWhiteBalanceAdjustEffect::_auto_register s_register(tfx::catalog::kWhiteBalance.wideGuid,
                                                             L"WhiteBalanceAdjust",
                                                             &NLEWhiteBalanceAdjustEffect::create,
                                                             &RegisterWhiteBalanceParams);

}  // namespace

void RegisterWhiteBalanceParams(NLEFilterInfoComPtr& d) {
  RegisterCatalogParams(d, tfx::catalog::kWhiteBalance);
}
