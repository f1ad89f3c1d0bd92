// lutAToWhiteEffect (OpenCL): fully transparent pixels become opaque black, on the device.
#include "plugin/NLEBasicCrossFilter.h"
#include "plugin/OpenCLBindings.h"

namespace {

class NLEOpenCL3dlutAToWhiteEffect final : public NLEBasicCrossFilter {
 public:
  static NLEBasicCrossFilter* create() { return new NLEOpenCL3dlutAToWhiteEffect(); }

  HRESULT InitFilter(INLECGDevice* device, const std::string& programPath) override {
    return InitFilterWithProgram(device, programPath, "lutAToWhiteEffect", "lut_a_to_white_effect",
                                 &program_, &kernel_);
  }

  HRESULT RunEffect(OPENCL::openclMemory* src, OPENCL::openclMemory* dst) override {
    if (!src) {
      // Nothing to read: the destination becomes what a copy without a source leaves.
      dst->copyToMemory(nullptr, true);
      return NLE_S_OK;
    }
    if (const HRESULT hr = CheckFramePair(src, dst); hr < 0) return hr;
    const OPENCL::openclMemoryInfo info = src->getOpenCLMemoryInfo();
    width_ = info.width;
    height_ = info.height;
    if (!SetMemoryArg(kernel_, 0, src) || !SetMemoryArg(kernel_, 1, dst)) return NLE_E_RESOURCE;
    return kernel_->runKernel(static_cast<unsigned>(width_), static_cast<unsigned>(height_), 1,
                              true)
               ? NLE_S_OK
               : NLE_E_RESOURCE;
  }

 private:
  OPENCL::openclProgram* program_ = nullptr;
  OPENCL::openclKernel* kernel_ = nullptr;
  int32_t width_ = 0;
  int32_t height_ = 0;
};

const NLEOpenCL3dlutAToWhiteEffect::_auto_register s_register(
    tfx::catalog::kAToWhite.wideGuid, L"lutAToWhiteEffect", &NLEOpenCL3dlutAToWhiteEffect::create);

}  // namespace
