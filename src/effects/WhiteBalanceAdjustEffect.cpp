// WhiteBalanceAdjust: temperature, tint and per-channel gains.
#include "effects/EffectParams.h"
#include "plugin/NLEDynamicEffect.h"
namespace {

// The pixel work of this effect is not part of this build: Transform keeps the base answer
// (not implemented), so hosts see a clean failure rather than an unchanged frame.
class NLEWhiteBalanceAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEWhiteBalanceAdjustEffect(); }
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
