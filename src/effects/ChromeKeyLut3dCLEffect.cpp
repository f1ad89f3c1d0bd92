// ChromeKeyLut3dCL (OpenCL): chroma keying through generated 3D LUTs on the device.
#include "plugin/NLEBasicCrossFilter.h"

namespace {

class NLEChromeKeyLut3dCLEffect final : public NLEBasicCrossFilter {
 public:
  static NLEBasicCrossFilter* create() { return new NLEChromeKeyLut3dCLEffect(); }

  HRESULT InitFilter(INLECGDevice* device, const std::string& programPath) override {
    return InitFilterWithProgram(device, programPath, "LUT", "MAIN");
  }
};

const NLEChromeKeyLut3dCLEffect::_auto_register s_register(L"DB4BBA18-48FC-4164-B572-E59757B02796",
                                                           L"ChromeKeyLut3dCL",
                                                           &NLEChromeKeyLut3dCLEffect::create);

}  // namespace
