// lutAToWhiteEffect (OpenCL): a key's alpha as a white matte on the device.
#include "plugin/NLEBasicCrossFilter.h"

namespace {

class NLEOpenCL3dlutAToWhiteEffect final : public NLEBasicCrossFilter {
 public:
  static NLEBasicCrossFilter* create() { return new NLEOpenCL3dlutAToWhiteEffect(); }

  HRESULT InitFilter(INLECGDevice* device, const std::string& programPath) override {
    return InitFilterWithProgram(device, programPath, "lutAToWhiteEffect", "lut_a_to_white_effect");
  }
};

const NLEOpenCL3dlutAToWhiteEffect::_auto_register s_register(
    L"969C6D5D-43AC-42F9-8F6C-9AB868BA9356", L"lutAToWhiteEffect",
    &NLEOpenCL3dlutAToWhiteEffect::create);

}  // namespace
