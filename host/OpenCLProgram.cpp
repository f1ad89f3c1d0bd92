// Programs shared by name on a device, built from source once, and the kernels they hand out.

#include <fstream>
#include <iterator>
#include <new>
#include <sstream>

#include "HostInternal.h"
#include "OpenCLInternal.h"
#include "Utf8.h"

namespace tfx::host {
namespace {

std::wstring Wide(const std::string& text) { return DecodeUtf8(text.data(), text.size()); }

void LogError(const std::string& message) {
  NLEGetDefaultLogger()->Log(kNLELogError, L"%ls", Wide(message).c_str());
}

}  // namespace

OPENCL::openclProgram* OpenCLProgramManager::getOpenCLProgram(const char* name) {
  if (!name) return nullptr;
  try {
    const auto found = programs_.find(name);
    return found == programs_.end() ? nullptr : found->second.get();
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
}

OPENCL::openclProgram* OpenCLProgramManager::createOpenCLProgram(const char* name) {
  if (!name || !*name) return nullptr;
  try {
    auto& slot = programs_[name];
    if (slot) return nullptr;
    slot = std::make_unique<OpenCLProgram>(cl_, name);
    return slot.get();
  } catch (const std::bad_alloc&) {
    programs_.erase(name);
    return nullptr;
  }
}

bool OpenCLProgram::loadProgram(const char* path, const char* options, const char* source,
                                size_t sourceLength) {
  if (loaded_) return true;
  try {
    if (source) {
      return Build(sourceLength ? std::string(source, sourceLength) : std::string(source), options);
    }
    const std::string file = std::string(path ? path : ".") + "/" + name_ + ".cl";
    std::ifstream in(file, std::ios::binary);
    std::ostringstream text;
    if (!(in && text << in.rdbuf())) {
      LogError("OpenCL program \"" + name_ + "\": cannot read " + file);
      return false;
    }
    return Build(text.str(), options);
  } catch (const std::bad_alloc&) {
    return false;
  }
}

bool OpenCLProgram::Build(const std::string& source, const char* options) {
  cl_int err = CL_SUCCESS;
  cl::Program program(cl_.context, source, false, &err);
  if (err != CL_SUCCESS) {
    LogError("OpenCL program \"" + name_ + "\": cannot be created (error " + std::to_string(err) +
             ")");
    return false;
  }
  err = program.build(std::vector<cl::Device>{cl_.device}, options ? options : "");
  if (err != CL_SUCCESS) {
    std::string log;
    program.getBuildInfo(cl_.device, CL_PROGRAM_BUILD_LOG, &log);
    LogError("OpenCL program \"" + name_ + "\" failed to build (error " + std::to_string(err) +
             "):\n" + log);
    return false;
  }
  program_ = std::move(program);
  loaded_ = true;
  return true;
}

OPENCL::openclKernel* OpenCLProgram::getopenclKernel(const char* name) {
  if (!name || !loaded_) return nullptr;
  try {
    if (const auto found = kernels_.find(name); found != kernels_.end()) return found->second.get();
    cl_int err = CL_SUCCESS;
    cl::Kernel kernel(program_, name, &err);
    if (err != CL_SUCCESS) return nullptr;
    auto& slot = kernels_[name];
    slot = std::make_unique<OpenCLKernel>(cl_, std::move(kernel));
    return slot.get();
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
}

bool OpenCLKernel::setKernelParameters(int index, OPENCL::DataType kind, void* value, size_t size) {
  if (index < 0) return false;
  const cl_uint at = static_cast<cl_uint>(index);
  switch (kind) {
    case OPENCL::kDataScalar:
      return value && size > 0 && kernel_.setArg(at, size, value) == CL_SUCCESS;
    case OPENCL::kDataMemory: {
      if (!value || size != sizeof(void*)) return false;
      auto* memory = *static_cast<OPENCL::openclMemory**>(value);
      if (!memory) return false;
      const cl_mem handle = static_cast<cl_mem>(memory->getNativeHandle());
      return kernel_.setArg(at, sizeof handle, &handle) == CL_SUCCESS;
    }
    case OPENCL::kDataLocal:
      return size > 0 && kernel_.setArg(at, size, nullptr) == CL_SUCCESS;
  }
  return false;
}

bool OpenCLProgram::runProgramKernel(OPENCL::openclKernel* kernel, unsigned w, unsigned h,
                                     unsigned localW, unsigned localH, bool wait) {
  OpenCLKernel* own = nullptr;
  for (const auto& entry : kernels_) {
    if (entry.second.get() == kernel) own = entry.second.get();
  }
  if (!own || w == 0 || h == 0) return false;
  if (localW == 0 && localH == 0) return own->Run(cl::NDRange(w, h), cl::NullRange, wait);
  if (localW == 0 || localH == 0 || w % localW != 0 || h % localH != 0) return false;
  return own->Run(cl::NDRange(w, h), cl::NDRange(localW, localH), wait);
}

bool OpenCLKernel::runKernel(unsigned w, unsigned h, unsigned d, bool wait) {
  if (w == 0 || h == 0 || d == 0) return false;
  return Run(d > 1 ? cl::NDRange(w, h, d) : cl::NDRange(w, h), cl::NullRange, wait);
}

bool OpenCLKernel::Run(const cl::NDRange& global, const cl::NDRange& local, bool wait) {
  if (cl_.queue.enqueueNDRangeKernel(kernel_, cl::NullRange, global, local) != CL_SUCCESS) {
    return false;
  }
  return !wait || cl_.queue.finish() == CL_SUCCESS;
}

}  // namespace tfx::host
