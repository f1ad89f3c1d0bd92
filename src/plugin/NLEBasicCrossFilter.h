// Base of every OpenCL effect: binds the filter to the host's compute device, turns frames into
// device memory and calls the effect's RunEffect. Owns the OpenCL filter registry.
#pragma once

#include <array>
#include <cstdint>
#include <string>

#include "plugin/NLEDynamicEffect.h"
#include "tessarofx/NLEOpenCL.h"

class NLEBasicCrossFilter : public NLEBasicFilter {
 public:
  using _auto_register = NLEAutoRegister<NLEBasicCrossFilter>;

  static NLEClassSet<NLEBasicCrossFilter>& get_class_set();
  static NLEBasicCrossFilter* create(const std::wstring& guid);

  ~NLEBasicCrossFilter() override;

  HRESULT Prepare(CGFilterParam param) override;
  HRESULT Running(INLEFrame* dst) override;

  // Binds the filter to a device: NLE_E_INVALIDARG without a device or without its OpenCL
  // operations, NLE_E_RESOURCE when the device cannot hand out its program manager and memory
  // handle.
  virtual HRESULT InitFilter(INLECGDevice* device, const std::string& programPath);
  virtual HRESULT RunEffect(OPENCL::openclMemory* src, OPENCL::openclMemory* dst);
  virtual HRESULT RunEffect(OPENCL::openclMemory* src, OPENCL::openclMemory* src2,
                            OPENCL::openclMemory* dst);
  // Brings the device copy of the clip's parameter block (sizes of `a` and `b`, times, regions,
  // angle) up to date, uploading it only when a byte changed. For kernels that take it; see
  // ParamMemory.
  virtual HRESULT CallParam(OPENCL::openclMemory* a, OPENCL::openclMemory* b);

  // The OpenCL memory of a surface-backed frame, or null.
  static OPENCL::openclMemory* GetFrameOpenCLMemory(INLEFrame* frame);

  static constexpr size_t kParamBlockSize = 108;

 protected:
  // The InitFilter of every OpenCL effect: binds to the device, then finds the program
  // `programName` (shared per program manager, by name) or creates it and builds it from
  // <programPath>/<programName>.cl, and, unless `*kernel` is already held, takes its kernel
  // `kernelName`. NLE_E_RESOURCE when any of that fails.
  HRESULT InitFilterWithProgram(INLECGDevice* device, const std::string& programPath,
                                const char* programName, const char* kernelName,
                                OPENCL::openclProgram** program, OPENCL::openclKernel** kernel);

  // NLE_S_OK when `src` and `dst` are frames the shipped kernels can address: BGRA8 frame
  // buffers of one size. Anything else would have a kernel index outside a memory object.
  static HRESULT CheckFramePair(OPENCL::openclMemory* src, OPENCL::openclMemory* dst);

  // Sets kernel argument `index` to a memory object; false when the runtime refuses it.
  static bool SetMemoryArg(OPENCL::openclKernel* kernel, int index, OPENCL::openclMemory* memory);
  template <typename T>
  static bool SetValueArg(OPENCL::openclKernel* kernel, int index, T value) {
    return kernel->setKernelParameters(index, OPENCL::kDataScalar, &value, sizeof value);
  }

  // Frees memory made through this filter's memory handle and clears the pointer.
  void ReleaseMemory(OPENCL::openclMemory** memory);

  OPENCL::openclProgramManager* ProgramManager() const { return programManager_; }
  OPENCL::openclMemManager* MemoryHandle() const { return memoryHandle_; }
  // The parameter block's device memory after a successful CallParam, else null.
  OPENCL::openclMemory* ParamMemory() const { return paramMemory_; }

 private:
  using ParamBlock = std::array<uint8_t, kParamBlockSize>;
  ParamBlock BuildParamBlock(OPENCL::openclMemory* a, OPENCL::openclMemory* b) const;

  OPENCL::openclMemory* paramMemory_ = nullptr;
  ParamBlock paramHostCopy_{};
  OPENCL::openclProgramManager* programManager_ = nullptr;
  OPENCL::openclMemManager* memoryHandle_ = nullptr;
  NLEComPtr<INLECGOpenCLOperate> operate_;
};
