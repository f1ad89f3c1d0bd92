// What the kit's OpenCL sources share: the Khronos bindings, configured once, and the classes
// behind the public OPENCL interfaces. Nothing here is exported.
#pragma once

// OpenCL 1.2 is what every runtime we meet offers; exceptions stay off, so every call's error
// code is checked by hand.
#define CL_HPP_TARGET_OPENCL_VERSION 120
#define CL_HPP_MINIMUM_OPENCL_VERSION 120
#include <CL/opencl.hpp>
#include <map>
#include <memory>
#include <string>

#include "tessarofx/NLEOpenCL.h"

namespace tfx::host {

// The context and queue every object of one device works with.
struct OpenCLContext {
  cl::Context context;
  cl::Device device;
  cl::CommandQueue queue;
};

class OpenCLMemory final : public OPENCL::openclMemory {
 public:
  OpenCLMemory(const OpenCLContext& cl, cl::Memory memory, const OPENCL::openclMemoryInfo& info)
      : queue_(cl.queue), memory_(std::move(memory)), info_(info) {}
  virtual ~OpenCLMemory() = default;

  OPENCL::openclMemoryInfo getOpenCLMemoryInfo() const override { return info_; }
  bool copyToMemory(OPENCL::openclMemory* source, bool copy) override;
  bool copyFromMemory(OPENCL::openclMemory* source) override;
  bool writeData2OpenCLMemory(const char* data, size_t size, size_t offset, bool blocking,
                              cl_command_queue queue) override;
  bool readDataFromOpenCLMemory(char* data, size_t size, size_t offset, bool blocking,
                                cl_command_queue queue) override;
  void* getNativeHandle() const override { return memory_(); }

 private:
  // Moves bytes between the host and the device in either direction.
  bool Transfer(char* data, size_t size, size_t offset, bool blocking, cl_command_queue queue,
                bool write);

  cl::CommandQueue queue_;
  cl::Memory memory_;
  OPENCL::openclMemoryInfo info_;
};

class OpenCLMemManager final : public OPENCL::openclMemManager {
 public:
  explicit OpenCLMemManager(const OpenCLContext& cl) : cl_(cl) {}
  virtual ~OpenCLMemManager() = default;

  bool createOpenCLMem(OPENCL::MemoryType type, int size, const void* init,
                       OPENCL::openclMemory** out) override;
  bool createOpenCLFrameMem(int width, int height, OPENCL::MemoryKind kind, const void* bgra,
                            int stride, OPENCL::openclMemory** out) override;
  void releaseOpenCLMem(OPENCL::openclMemory* memory) override;

 private:
  const OpenCLContext& cl_;
};

class OpenCLKernel final : public OPENCL::openclKernel {
 public:
  OpenCLKernel(const OpenCLContext& cl, cl::Kernel kernel) : cl_(cl), kernel_(std::move(kernel)) {}
  virtual ~OpenCLKernel() = default;

  bool setKernelParameters(int index, OPENCL::DataType kind, void* value, size_t size) override;
  bool runKernel(unsigned w, unsigned h, unsigned d, bool wait) override;
  // Enqueues over `global` in work-groups of `local` (cl::NullRange: the runtime chooses).
  bool Run(const cl::NDRange& global, const cl::NDRange& local, bool wait);

 private:
  const OpenCLContext& cl_;
  cl::Kernel kernel_;
};

class OpenCLProgram final : public OPENCL::openclProgram {
 public:
  OpenCLProgram(const OpenCLContext& cl, std::string name) : cl_(cl), name_(std::move(name)) {}
  virtual ~OpenCLProgram() = default;

  bool loadProgram(const char* path, const char* options, const char* source,
                   size_t sourceLength) override;
  bool isLoaded() const override { return loaded_; }
  const char* getName() const override { return name_.c_str(); }
  OPENCL::openclKernel* getopenclKernel(const char* name) override;
  bool runProgramKernel(OPENCL::openclKernel* kernel, unsigned w, unsigned h, unsigned localW,
                        unsigned localH, bool wait) override;

 private:
  bool Build(const std::string& source, const char* options);

  const OpenCLContext& cl_;
  const std::string name_;
  cl::Program program_;
  bool loaded_ = false;
  std::map<std::string, std::unique_ptr<OpenCLKernel>> kernels_;
};

class OpenCLProgramManager final : public OPENCL::openclProgramManager {
 public:
  explicit OpenCLProgramManager(const OpenCLContext& cl) : cl_(cl) {}
  virtual ~OpenCLProgramManager() = default;

  OPENCL::openclProgram* getOpenCLProgram(const char* name) override;
  OPENCL::openclProgram* createOpenCLProgram(const char* name) override;

 private:
  const OpenCLContext& cl_;
  std::map<std::string, std::unique_ptr<OpenCLProgram>> programs_;
};

}  // namespace tfx::host
