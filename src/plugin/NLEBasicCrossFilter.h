// Base of every OpenCL effect: binds the filter to the host's compute device, turns frames into
// device memory and calls the effect's RunEffect. Owns the OpenCL filter registry.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "plugin/NLEDynamicEffect.h"

namespace OPENCL {
class openclProgramManager;
class openclMemManager;
class openclMemory;
}  // namespace OPENCL

class NLEBasicCrossFilter : public NLEBasicFilter {
 public:
  using _auto_register = NLEAutoRegister<NLEBasicCrossFilter>;

  static NLEClassSet<NLEBasicCrossFilter>& get_class_set();
  static NLEBasicCrossFilter* create(const std::wstring& guid);

  HRESULT Prepare(CGFilterParam param) override;
  HRESULT Running(INLEFrame* dst) override;

  // Binds the filter to a device: NLE_E_INVALIDARG without a device or without its OpenCL
  // operations, NLE_E_RESOURCE when the device cannot hand out its program manager and memory
  // handle.
  virtual HRESULT InitFilter(INLECGDevice* device, const std::string& programPath);
  virtual HRESULT RunEffect(OPENCL::openclMemory* src, OPENCL::openclMemory* dst);
  virtual HRESULT RunEffect(OPENCL::openclMemory* src, OPENCL::openclMemory* src2,
                            OPENCL::openclMemory* dst);
  virtual HRESULT CallParam(OPENCL::openclMemory* a, OPENCL::openclMemory* b);

  // The OpenCL memory of a surface-backed frame, or null.
  static OPENCL::openclMemory* GetFrameOpenCLMemory(INLEFrame* frame);

 protected:
  // The InitFilter of every OpenCL effect: binds to the device, then builds (or finds, shared
  // per device by name) the effect's program and caches its kernel.
  HRESULT InitFilterWithProgram(INLECGDevice* device, const std::string& programPath,
                                const char* programName, const char* kernelName);

  OPENCL::openclProgramManager* ProgramManager() const { return programManager_; }
  OPENCL::openclMemManager* MemoryHandle() const { return memoryHandle_; }

 private:
  OPENCL::openclMemory* paramMemory_ = nullptr;
  std::vector<uint8_t> paramHostCopy_;
  OPENCL::openclProgramManager* programManager_ = nullptr;
  OPENCL::openclMemManager* memoryHandle_ = nullptr;
  NLEComPtr<INLECGOpenCLOperate> operate_;
};
