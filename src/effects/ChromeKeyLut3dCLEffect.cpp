// ChromeKeyLut3dCL (OpenCL): chroma keying through generated 3D LUTs on the device.
#include "plugin/NLEBasicCrossFilter.h"

namespace {

class NLEChromeKeyLut3dCLEffect final : public NLEBasicCrossFilter {
 public:
  static NLEBasicCrossFilter* create() { return new NLEChromeKeyLut3dCLEffect(); }

  HRESULT InitFilter(INLECGDevice* device, const std::string& programPath) override {
    const HRESULT hr = NLEBasicCrossFilter::InitFilter(device, programPath);
    if (hr == NLE_E_RESOURCE) return hr;
    return InitProgram("LUT", "MAIN", programPath);
  }
};

const NLEChromeKeyLut3dCLEffect::_auto_register s_register(L"DB4BBA18-48FC-4164-B572-E59757B02796",
                                                           L"ChromeKeyLut3dCL",
                                                           &NLEChromeKeyLut3dCLEffect::create);

}  // namespace
