// The compute device a host passes to filters: one OpenCL device with its context, queue,
// program manager and memory manager, chosen from every device of every platform.

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <utility>
#include <vector>

#include "HostInternal.h"
#include "OpenCLInternal.h"
#include "Utf8.h"

namespace tfx::host {
namespace {

struct ListedDevice {
  cl::Platform platform;
  cl::Device device;
};

// Every device in platform order. A machine without an OpenCL runtime, or whose loader finds no
// platform, has none.
std::vector<ListedDevice> AllDevices() {
  std::vector<ListedDevice> all;
  std::vector<cl::Platform> platforms;
  if (cl::Platform::get(&platforms) != CL_SUCCESS) return all;
  for (const cl::Platform& platform : platforms) {
    std::vector<cl::Device> devices;
    if (platform.getDevices(CL_DEVICE_TYPE_ALL, &devices) != CL_SUCCESS) continue;
    for (cl::Device& device : devices) all.push_back({platform, std::move(device)});
  }
  return all;
}

cl_device_type TypeOf(const cl::Device& device) {
  cl_device_type type = 0;
  device.getInfo(CL_DEVICE_TYPE, &type);
  return type;
}

// The device a host gets when it does not name one: the environment's choice, else the first
// GPU, else the first CPU, else the first device. -1 for a malformed or out-of-range variable.
int DefaultIndex(const std::vector<ListedDevice>& all) {
  if (const char* chosen = std::getenv("TESSAROFX_OPENCL_DEVICE"); chosen && *chosen) {
    char* end = nullptr;
    errno = 0;
    const long index = std::strtol(chosen, &end, 10);
    if (errno != 0 || *end != '\0' || index < 0 || index >= static_cast<long>(all.size())) {
      return -1;
    }
    return static_cast<int>(index);
  }
  for (cl_device_type wanted : {CL_DEVICE_TYPE_GPU, CL_DEVICE_TYPE_CPU}) {
    for (size_t i = 0; i < all.size(); ++i) {
      if (TypeOf(all[i].device) & wanted) return static_cast<int>(i);
    }
  }
  return 0;
}

void CopyCut(char* to, size_t capacity, const std::string& from) {
  const size_t n = std::min(from.size(), capacity - 1);
  std::memcpy(to, from.data(), n);
  to[n] = '\0';
}

class OpenCLDevice final : public scombase::CUnknown,
                           public INLECGDevice,
                           public INLECGOpenCLOperate {
 public:
  OpenCLDevice(OpenCLContext cl, std::wstring name)
      : CUnknown(L"NLEOpenCLDevice", nullptr),
        cl_(std::move(cl)),
        name_(std::move(name)),
        programs_(cl_),
        memory_(cl_) {}

  NLE_DECLARE_IUNKNOWN

  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override {
    if (!out) return NLE_E_POINTER;
    if (iid == IID_INLECGDevice) return GetInterface(static_cast<INLECGDevice*>(this), out);
    if (iid == IID_INLECGOpenCLOperate) {
      return GetInterface(static_cast<INLECGOpenCLOperate*>(this), out);
    }
    return CUnknown::NonDelegatingQueryInterface(iid, out);
  }

  HRESULT GetName(wchar_t* buf, uint32_t capacity) override {
    if (!buf || capacity == 0) return NLE_E_POINTER;
    const size_t n = std::min<size_t>(name_.size(), capacity - 1);
    std::wmemcpy(buf, name_.data(), n);
    buf[n] = L'\0';
    return NLE_S_OK;
  }

  HRESULT GetOpenCLHandles(void** programManager, void** memoryHandle) override {
    if (!programManager || !memoryHandle) return NLE_E_POINTER;
    *programManager = static_cast<OPENCL::openclProgramManager*>(&programs_);
    *memoryHandle = static_cast<OPENCL::openclMemManager*>(&memory_);
    return NLE_S_OK;
  }

 private:
  // The managers keep a reference to cl_, so it is declared (and built) before them.
  const OpenCLContext cl_;
  const std::wstring name_;
  OpenCLProgramManager programs_;
  OpenCLMemManager memory_;
};

}  // namespace
}  // namespace tfx::host

namespace NLECommon {

HRESULT ListOpenCLDevices(NLEOpenCLDeviceInfo* out, uint32_t capacity, uint32_t* count) {
  using namespace tfx::host;
  if (!count) return NLE_E_POINTER;
  *count = 0;
  if (!out && capacity > 0) return NLE_E_POINTER;
  return CallGuarded([&] {
    const std::vector<ListedDevice> all = AllDevices();
    *count = static_cast<uint32_t>(all.size());
    for (uint32_t i = 0; i < std::min(capacity, *count); ++i) {
      std::string platform, device;
      all[i].platform.getInfo(CL_PLATFORM_NAME, &platform);
      all[i].device.getInfo(CL_DEVICE_NAME, &device);
      // Some runtimes count the terminating zero in the names' length.
      platform = platform.c_str();
      device = device.c_str();
      CopyCut(out[i].platform, sizeof out[i].platform, platform);
      CopyCut(out[i].device, sizeof out[i].device, device);
      out[i].type = TypeOf(all[i].device);
    }
    return NLE_S_OK;
  });
}

HRESULT CreateOpenCLDevice(int32_t index, INLECGDevice** out) {
  using namespace tfx::host;
  if (!out) return NLE_E_POINTER;
  *out = nullptr;
  if (index < -1) return NLE_E_INVALIDARG;
  return CallGuarded([&]() -> HRESULT {
    const std::vector<ListedDevice> all = AllDevices();
    if (all.empty()) return NLE_E_RESOURCE;
    const int chosen = index == -1 ? DefaultIndex(all) : index;
    if (chosen < 0 || chosen >= static_cast<int>(all.size())) return NLE_E_INVALIDARG;
    OpenCLContext cl;
    cl.device = all[chosen].device;
    cl_int err = CL_SUCCESS;
    cl.context = cl::Context(cl.device, nullptr, nullptr, nullptr, &err);
    if (err != CL_SUCCESS) return NLE_E_RESOURCE;
    cl.queue = cl::CommandQueue(cl.context, cl.device, 0, &err);
    if (err != CL_SUCCESS) return NLE_E_RESOURCE;
    std::string name;
    cl.device.getInfo(CL_DEVICE_NAME, &name);
    name = name.c_str();
    auto* device = new OpenCLDevice(std::move(cl), DecodeUtf8(name.data(), name.size()));
    device->NonDelegatingAddRef();
    *out = device;
    return NLE_S_OK;
  });
}

}  // namespace NLECommon
