// WhiteBalanceAdjust (OpenCL): temperature and tint on the device.
#include "effects/EffectParams.h"
#include "plugin/NLEBasicCrossFilter.h"
#include "plugin/OpenCLBindings.h"

namespace {

class NLEOpenCLWhiteBalanceAdjustEffect final : public NLEBasicCrossFilter {
 public:
  static NLEBasicCrossFilter* create() { return new NLEOpenCLWhiteBalanceAdjustEffect(); }

  HRESULT InitFilter(INLECGDevice* device, const std::string& programPath) override {
    return InitFilterWithProgram(device, programPath, "WhiteBalanceAdjust", "auto_white_balance",
                                 &program_, &kernel_);
  }

  HRESULT RunEffect(OPENCL::openclMemory* src, OPENCL::openclMemory* dst) override {
    if (!src) return NLE_E_NOTIMPL;
    const double temperature = ParamDouble(L"u_temperature");
    const double tint = ParamDouble(L"u_tint");
    // The gains are read as the CPU class reads them, and, as there, take no part.
    (void)ParamDouble(L"u_rgain", 1.0);
    (void)ParamDouble(L"u_ggain", 1.0);
    (void)ParamDouble(L"u_bgain", 1.0);
    const double t = temperature / 200.0;
    const double b = tint / 200.0;
    // Derived in double straight from the parameters; the CPU class narrows t and b to float
    // first, so a factor can differ from its CPU twin in the last bit.
    const float k2 = static_cast<float>(1.0 + 0.5 * b - t);
    const float k3 = static_cast<float>(1.0 - b);
    const float k4 = static_cast<float>(1.0 + 0.5 * b + t);

    if (const HRESULT hr = CheckFramePair(src, dst); hr < 0) return hr;
    const OPENCL::openclMemoryInfo info = src->getOpenCLMemoryInfo();
    if (!SetMemoryArg(kernel_, 0, src) || !SetMemoryArg(kernel_, 1, dst) ||
        !SetValueArg(kernel_, 2, k2) || !SetValueArg(kernel_, 3, k3) ||
        !SetValueArg(kernel_, 4, k4))
      return NLE_E_RESOURCE;
    return kernel_->runKernel(static_cast<unsigned>(info.width), static_cast<unsigned>(info.height),
                              1, true)
               ? NLE_S_OK
               : NLE_E_RESOURCE;
  }

 private:
  OPENCL::openclProgram* program_ = nullptr;
  OPENCL::openclKernel* kernel_ = nullptr;
};

const NLEOpenCLWhiteBalanceAdjustEffect::_auto_register s_register(
    tfx::catalog::kWhiteBalance.wideGuid, L"WhiteBalanceAdjust",
    &NLEOpenCLWhiteBalanceAdjustEffect::create, &RegisterWhiteBalanceParams);

}  // namespace
