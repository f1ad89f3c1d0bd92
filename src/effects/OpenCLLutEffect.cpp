// Lut (OpenCL): a 3D LUT file named by "lut3dPath" applied on the device.
#include "effects/LutFileCache.h"
#include "effects/OpenCLLutTables.h"
#include "plugin/NLEBasicCrossFilter.h"
#include "plugin/OpenCLBindings.h"

namespace {

class NLEOpenCLLut final : public NLEBasicCrossFilter {
 public:
  static NLEBasicCrossFilter* create() { return new NLEOpenCLLut(); }

  ~NLEOpenCLLut() override { ReleaseDeviceLut(MemoryHandle(), &tables_); }

  HRESULT InitFilter(INLECGDevice* device, const std::string& programPath) override {
    return InitFilterWithProgram(device, programPath, "LUT", "MAIN", &program_, &kernel_);
  }

  HRESULT RunEffect(OPENCL::openclMemory* src, OPENCL::openclMemory* dst) override {
    if (!src) return NLE_E_NOTIMPL;
    const std::wstring path = GetParamWString(tfx::catalog::lut::kPath);
    if (path.empty()) return NLE_E_RESOURCE;
    const OPENCL::openclMemoryInfo info = src->getOpenCLMemoryInfo();
    if (lut_.Refresh(path) && lut_.Loaded()) createTableMemory(0, 0);

    if (!lut_.Loaded()) {
      // An unreadable file passes the frame through, as on the CPU.
      dst->copyFromMemory(src);
      return NLE_S_OK;
    }
    if (const HRESULT hr = CheckFramePair(src, dst); hr < 0) return hr;
    // A buffer that could not be made is refused here rather than leaving the kernel pointed at
    // an older one.
    if (!SetMemoryArg(kernel_, 0, src) || !SetMemoryArg(kernel_, 1, dst) ||
        !SetDeviceLutArgs(kernel_, tables_, lut_.Table().getLutSize()) ||
        !SetValueArg(kernel_, 5, kernelInts_[0]) || !SetValueArg(kernel_, 6, kernelInts_[1]))
      return NLE_E_RESOURCE;
    return program_->runProgramKernel(kernel_, static_cast<unsigned>(info.width),
                                      static_cast<unsigned>(info.height), 1, 1, true)
               ? NLE_S_OK
               : NLE_E_RESOURCE;
  }

  // The table's lattice and per-byte tables to the device, replacing the old buffers; both
  // arguments are unused.
  bool createTableMemory(int, int) {
    return UploadDeviceLut(MemoryHandle(), lut_.Table(), &tables_);
  }

 private:
  OPENCL::openclProgram* program_ = nullptr;
  OPENCL::openclKernel* kernel_ = nullptr;
  DeviceLutTables tables_;
  // Kernel arguments 5 and 6: how the kernel indexes the full stored lattice.
  int32_t kernelInts_[2] = {kLutLatticeAxis, kLutLatticePoint};
  LutFileCache lut_;
};

const NLEOpenCLLut::_auto_register s_register(tfx::catalog::kLut.wideGuid, L"Lut",
                                              &NLEOpenCLLut::create);

}  // namespace
