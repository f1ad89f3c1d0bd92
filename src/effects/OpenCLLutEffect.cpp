// Lut (OpenCL): a 3D LUT file applied on the device.
#include "plugin/NLEBasicCrossFilter.h"

namespace {

class NLEOpenCLLut final : public NLEBasicCrossFilter {
 public:
  static NLEBasicCrossFilter* create() { return new NLEOpenCLLut(); }

  HRESULT InitFilter(INLECGDevice* device, const std::string& programPath) override {
    return InitFilterWithProgram(device, programPath, "LUT", "MAIN");
  }
};

const NLEOpenCLLut::_auto_register s_register(L"74EB022D-1D73-4D1E-9F70-487C356D46CD", L"Lut",
                                              &NLEOpenCLLut::create);

}  // namespace
