// WhiteBalanceAdjust (OpenCL): temperature and tint on the device.
#include "effects/EffectParams.h"
#include "plugin/NLEBasicCrossFilter.h"
namespace {

class NLEOpenCLWhiteBalanceAdjustEffect final : public NLEBasicCrossFilter {
 public:
  static NLEBasicCrossFilter* create() { return new NLEOpenCLWhiteBalanceAdjustEffect(); }

  HRESULT InitFilter(INLECGDevice* device, const std::string& programPath) override {
    return InitFilterWithProgram(device, programPath, "WhiteBalanceAdjust", "auto_white_balance");
  }
};

const NLEOpenCLWhiteBalanceAdjustEffect::_auto_register s_register(
    L"39509FB9-39FB-4516-9464-3D891DD61D62", L"WhiteBalanceAdjust",
    &NLEOpenCLWhiteBalanceAdjustEffect::create, &RegisterWhiteBalanceParams);

}  // namespace
