// ChromeKeyLut3dCL (OpenCL): green- and blue-screen keying through generated 3D LUTs on the
// device. Mode 0 gives the key mask, mode 1 the colours with the screen's spill removed.
#include "effects/ChromeKeyTables.h"
#include "effects/OpenCLLutTables.h"
#include "plugin/NLEBasicCrossFilter.h"
#include "plugin/OpenCLBindings.h"

namespace {

class NLEChromeKeyLut3dCLEffect final : public NLEBasicCrossFilter {
 public:
  static NLEBasicCrossFilter* create() { return new NLEChromeKeyLut3dCLEffect(); }

  ~NLEChromeKeyLut3dCLEffect() override {
    ReleaseDeviceLut(MemoryHandle(), &beauty_);
    ReleaseDeviceLut(MemoryHandle(), &alpha_);
  }

  HRESULT InitFilter(INLECGDevice* device, const std::string& programPath) override {
    return InitFilterWithProgram(device, programPath, "LUT", "MAIN", &program_, &kernel_);
  }

  HRESULT RunEffect(OPENCL::openclMemory* src, OPENCL::openclMemory* dst) override {
    if (!src) return NLE_E_INVALIDARG;
    using namespace tfx::catalog::chroma_key;
    const int red = ParamInt(kRed);
    const int blue = ParamInt(kBlue);
    const int green = ParamInt(kGreen);
    const double contrast = ParamDouble(kContrast);
    const double offset = ParamDouble(kOffset);
    const ChromeKeyTables::Rebuilt rebuilt =
        tables_.KeepCurrent(red, green, blue, contrast, offset);
    if (rebuilt.beauty) createTableMemoryRGB();
    if (rebuilt.alpha) createTableMemoryAlpha();

    // Any other mode keeps the table an earlier frame chose. The buffers are bound afresh, as a
    // rebuild since then has replaced them; before any choice there is nothing to run.
    const int mode = ParamInt(kMode);
    if (mode == 0 || mode == 1) boundTable_ = mode;
    if (boundTable_ < 0) return NLE_E_RESOURCE;
    const bool beauty = boundTable_ == 1;

    if (const HRESULT hr = CheckFramePair(src, dst); hr < 0) return hr;
    CubeLut& table = beauty ? tables_.Beauty() : tables_.Alpha();
    if (!SetDeviceLutArgs(kernel_, beauty ? beauty_ : alpha_, table.getLutSize()) ||
        !SetMemoryArg(kernel_, 0, src) || !SetMemoryArg(kernel_, 1, dst) ||
        !SetValueArg(kernel_, 5, kernelInts_[0]) || !SetValueArg(kernel_, 6, kernelInts_[1]))
      return NLE_E_RESOURCE;
    const OPENCL::openclMemoryInfo info = src->getOpenCLMemoryInfo();
    return program_->runProgramKernel(kernel_, static_cast<unsigned>(info.width),
                                      static_cast<unsigned>(info.height), 1, 1, true)
               ? NLE_S_OK
               : NLE_E_RESOURCE;
  }

  bool createTableMemoryRGB() {
    return UploadDeviceLut(MemoryHandle(), tables_.Beauty(), &beauty_);
  }
  bool createTableMemoryAlpha() {
    return UploadDeviceLut(MemoryHandle(), tables_.Alpha(), &alpha_);
  }

 private:
  OPENCL::openclProgram* program_ = nullptr;
  OPENCL::openclKernel* kernel_ = nullptr;
  DeviceLutTables beauty_;
  DeviceLutTables alpha_;
  ChromeKeyTables tables_;
  // Kernel arguments 5 and 6: how the kernel indexes the full stored lattice.
  int32_t kernelInts_[2] = {kLutLatticeAxis, kLutLatticePoint};
  // The table the kernel applies: 0 alpha, 1 beauty, -1 none chosen yet.
  int boundTable_ = -1;
};

const NLEChromeKeyLut3dCLEffect::_auto_register s_register(tfx::catalog::kChromeKey.wideGuid,
                                                           L"ChromeKeyLut3dCL",
                                                           &NLEChromeKeyLut3dCLEffect::create);

}  // namespace
