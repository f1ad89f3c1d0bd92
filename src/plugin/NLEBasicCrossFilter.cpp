#include "plugin/NLEBasicCrossFilter.h"

#include <cstring>

namespace {

void Put(std::array<uint8_t, NLEBasicCrossFilter::kParamBlockSize>& block, size_t offset,
         int32_t v) {
  std::memcpy(block.data() + offset, &v, sizeof v);
}

void Put(std::array<uint8_t, NLEBasicCrossFilter::kParamBlockSize>& block, size_t offset, float v) {
  std::memcpy(block.data() + offset, &v, sizeof v);
}

void PutRect(std::array<uint8_t, NLEBasicCrossFilter::kParamBlockSize>& block, size_t offset,
             const NLERectF& r) {
  Put(block, offset, static_cast<float>(r.x));
  Put(block, offset + 4, static_cast<float>(r.y));
  Put(block, offset + 8, static_cast<float>(r.width));
  Put(block, offset + 12, static_cast<float>(r.height));
}

}  // namespace

NLEClassSet<NLEBasicCrossFilter>& NLEBasicCrossFilter::get_class_set() {
  static NLEClassSet<NLEBasicCrossFilter> set;
  return set;
}

NLEBasicCrossFilter* NLEBasicCrossFilter::create(const std::wstring& guid) {
  return NLECreateRegistered<NLEBasicCrossFilter>(guid);
}

NLEBasicCrossFilter::~NLEBasicCrossFilter() { ReleaseMemory(&paramMemory_); }

HRESULT NLEBasicCrossFilter::Prepare(CGFilterParam) { return NLE_S_OK; }

HRESULT NLEBasicCrossFilter::InitFilter(INLECGDevice* device, const std::string&) {
  if (!device) return NLE_E_INVALIDARG;
  NLEComPtr<INLECGOpenCLOperate> operate;
  if (device->QueryInterface(IID_INLECGOpenCLOperate, reinterpret_cast<void**>(&operate)) < 0 ||
      !operate)
    return NLE_E_INVALIDARG;
  void* manager = nullptr;
  void* memory = nullptr;
  const HRESULT hr = operate->GetOpenCLHandles(&manager, &memory);
  if (hr < 0 && !manager) return NLE_E_RESOURCE;
  // Memory made through an earlier device's manager must go back to that manager.
  if (memory != memoryHandle_) ReleaseMemory(&paramMemory_);
  operate_ = operate;
  programManager_ = static_cast<OPENCL::openclProgramManager*>(manager);
  memoryHandle_ = static_cast<OPENCL::openclMemManager*>(memory);
  return programManager_ && memoryHandle_ ? NLE_S_OK : NLE_E_RESOURCE;
}

HRESULT NLEBasicCrossFilter::InitFilterWithProgram(INLECGDevice* device,
                                                   const std::string& programPath,
                                                   const char* programName, const char* kernelName,
                                                   OPENCL::openclProgram** program,
                                                   OPENCL::openclKernel** kernel) {
  // Only a resource failure stops here; without a device there is no manager either, so the
  // program step below fails with the same code.
  if (NLEBasicCrossFilter::InitFilter(device, programPath) == NLE_E_RESOURCE) return NLE_E_RESOURCE;
  if (!programManager_) return NLE_E_RESOURCE;
  OPENCL::openclProgram* found = programManager_->getOpenCLProgram(programName);
  if (!found) {
    found = programManager_->createOpenCLProgram(programName);
    if (!found) return NLE_E_RESOURCE;
    *program = found;
    if (!found->loadProgram(programPath.c_str(), nullptr, nullptr, 0)) return NLE_E_RESOURCE;
  }
  *program = found;
  if (!*kernel) *kernel = found->getopenclKernel(kernelName);
  return *kernel ? NLE_S_OK : NLE_E_RESOURCE;
}

HRESULT NLEBasicCrossFilter::RunEffect(OPENCL::openclMemory*, OPENCL::openclMemory*) {
  return NLE_E_NOTIMPL;
}

HRESULT NLEBasicCrossFilter::RunEffect(OPENCL::openclMemory*, OPENCL::openclMemory*,
                                       OPENCL::openclMemory*) {
  return NLE_E_NOTIMPL;
}

NLEBasicCrossFilter::ParamBlock NLEBasicCrossFilter::BuildParamBlock(
    OPENCL::openclMemory* a, OPENCL::openclMemory* b) const {
  ParamBlock block{};
  if (a) {
    const OPENCL::openclMemoryInfo info = a->getOpenCLMemoryInfo();
    Put(block, 0, info.width);
    Put(block, 32, info.height);
  }
  if (b) {
    const OPENCL::openclMemoryInfo info = b->getOpenCLMemoryInfo();
    Put(block, 4, info.width);
    Put(block, 36, info.height);
  }
  const NLERational& rate = Framerate();
  const double fps = static_cast<double>(rate.num) / static_cast<double>(rate.den);
  Put(block, 64, static_cast<float>(CurrentTime() / fps));
  Put(block, 68, static_cast<float>(TotalTime() / fps));
  PutRect(block, 72, InnerRegion());
  PutRect(block, 88, RegionOfInterest());
  Put(block, 104, Angle());
  return block;
}

HRESULT NLEBasicCrossFilter::CallParam(OPENCL::openclMemory* a, OPENCL::openclMemory* b) {
  const ParamBlock block = BuildParamBlock(a, b);
  if (!paramMemory_) {
    if (!memoryHandle_ ||
        !memoryHandle_->createOpenCLMem(OPENCL::kMemParamBlock, static_cast<int>(block.size()),
                                        block.data(), &paramMemory_)) {
      paramMemory_ = nullptr;
      return NLE_E_RESOURCE;
    }
    paramHostCopy_ = block;
    return NLE_S_OK;
  }
  if (block == paramHostCopy_) return NLE_S_OK;
  // The host copy follows only a write that went through, so a failed one is retried next time.
  if (paramMemory_->writeData2OpenCLMemory(reinterpret_cast<const char*>(block.data()),
                                           block.size(), 0, true, nullptr)) {
    paramHostCopy_ = block;
  }
  return NLE_S_OK;
}

OPENCL::openclMemory* NLEBasicCrossFilter::GetFrameOpenCLMemory(INLEFrame* frame) {
  if (!frame) return nullptr;
  NLEFrameDesc desc{};
  if (frame->GetDescription(&desc, false, false) < 0 || desc.storage != kNLEFrameStorageSurface)
    return nullptr;
  NLEComPtr<INLEFrameSurface> surface;
  if (frame->GetSurface(&surface) < 0 || !surface) return nullptr;
  OPENCL::openclMemory* memory = nullptr;
  if (surface->GetKind() == kNLESurfaceOpenCL)
    memory = static_cast<OPENCL::openclMemory*>(surface->GetDeviceMemory());
  frame->ReleaseSurface(surface);
  return memory;
}

HRESULT NLEBasicCrossFilter::Running(INLEFrame* dst) {
  if (!dst) return NLE_E_INVALIDARG;
  if (!programManager_ || !memoryHandle_) return NLE_E_RESOURCE;
  OPENCL::openclMemory* dstMem = GetFrameOpenCLMemory(dst);
  if (!dstMem) return NLE_E_INVALIDARG;
  OPENCL::openclMemory* fgMem = GetFrameOpenCLMemory(Foreground());
  OPENCL::openclMemory* bgMem = GetFrameOpenCLMemory(Background());
  if (fgMem && bgMem) return RunEffect(fgMem, bgMem, dstMem);
  if (fgMem) return RunEffect(fgMem, dstMem);
  if (bgMem) return RunEffect(bgMem, dstMem);
  return NLE_E_RESOURCE;
}

HRESULT NLEBasicCrossFilter::CheckFramePair(OPENCL::openclMemory* src, OPENCL::openclMemory* dst) {
  if (!src || !dst) return NLE_E_INVALIDARG;
  const OPENCL::openclMemoryInfo s = src->getOpenCLMemoryInfo();
  const OPENCL::openclMemoryInfo d = dst->getOpenCLMemoryInfo();
  if (s.kind != OPENCL::kMemoryFrameBuffer || d.kind != OPENCL::kMemoryFrameBuffer ||
      s.width != d.width || s.height != d.height || s.width < 1 || s.height < 1)
    return NLE_E_INVALIDARG;
  return NLE_S_OK;
}

bool NLEBasicCrossFilter::SetMemoryArg(OPENCL::openclKernel* kernel, int index,
                                       OPENCL::openclMemory* memory) {
  return kernel->setKernelParameters(index, OPENCL::kDataMemory, &memory, sizeof memory);
}

void NLEBasicCrossFilter::ReleaseMemory(OPENCL::openclMemory** memory) {
  if (*memory && memoryHandle_) memoryHandle_->releaseOpenCLMem(*memory);
  *memory = nullptr;
}
