#include "plugin/NLEBasicCrossFilter.h"

NLEClassSet<NLEBasicCrossFilter>& NLEBasicCrossFilter::get_class_set() {
  static NLEClassSet<NLEBasicCrossFilter> set;
  return set;
}

NLEBasicCrossFilter* NLEBasicCrossFilter::create(const std::wstring& guid) {
  return NLECreateRegistered<NLEBasicCrossFilter>(guid);
}

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
  operate_ = operate;
  programManager_ = static_cast<OPENCL::openclProgramManager*>(manager);
  memoryHandle_ = static_cast<OPENCL::openclMemManager*>(memory);
  return programManager_ && memoryHandle_ ? NLE_S_OK : NLE_E_RESOURCE;
}

HRESULT NLEBasicCrossFilter::InitFilterWithProgram(INLECGDevice* device,
                                                   const std::string& programPath, const char*,
                                                   const char*) {
  const HRESULT hr = NLEBasicCrossFilter::InitFilter(device, programPath);
  if (hr == NLE_E_RESOURCE) return hr;
  // This build carries no OpenCL program loader yet, so no kernel can be made ready.
  return NLE_E_RESOURCE;
}

HRESULT NLEBasicCrossFilter::RunEffect(OPENCL::openclMemory*, OPENCL::openclMemory*) {
  return NLE_E_NOTIMPL;
}

HRESULT NLEBasicCrossFilter::RunEffect(OPENCL::openclMemory*, OPENCL::openclMemory*,
                                       OPENCL::openclMemory*) {
  return NLE_E_NOTIMPL;
}

HRESULT NLEBasicCrossFilter::CallParam(OPENCL::openclMemory*, OPENCL::openclMemory*) {
  return NLE_E_NOTIMPL;
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
