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
    const double temperature = ParamDouble(L"u_temperature");
    const double tint = ParamDouble(L"u_tint");
    const ColorGain gain{static_cast<float>(ParamDouble(L"u_rgain", 1.0)),
                         static_cast<float>(ParamDouble(L"u_ggain", 1.0)),
                         static_cast<float>(ParamDouble(L"u_bgain", 1.0))};
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

const NLEWhiteBalanceAdjustEffect::_auto_register s_register(
    L"39509FB9-39FB-4516-9464-3D891DD61D62", L"WhiteBalanceAdjust",
    &NLEWhiteBalanceAdjustEffect::create, &RegisterWhiteBalanceParams);

}  // namespace

// The gains' range of -100..100 around a default of 1 is what hosts have always been given.
void RegisterWhiteBalanceParams(NLEFilterInfoComPtr& d) {
  const auto kDouble = NLEFilterPropertyType_Double;
  d.AddParam<double>(L"u_temperature", kDouble, 0.0, -100.0, 100.0, 1.0, L"u_temperature", 0);
  d.AddParam<double>(L"u_tint", kDouble, 0.0, -100.0, 100.0, 1.0, L"u_tint", 0);
  d.AddParam<double>(L"u_rgain", kDouble, 1.0, -100.0, 100.0, 1.0, L"u_rgain", 0);
  d.AddParam<double>(L"u_ggain", kDouble, 1.0, -100.0, 100.0, 1.0, L"u_ggain", 0);
  d.AddParam<double>(L"u_bgain", kDouble, 1.0, -100.0, 100.0, 1.0, L"u_bgain", 0);
}
