#include "plugin/OpenCLDevices.h"

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "media/Text.h"

namespace tfxtool {
namespace {

constexpr uint64_t kTypeCpu = 2, kTypeGpu = 4, kTypeAccelerator = 8;

std::string Range(size_t count) {
  return count == 1 ? "there is 1 OpenCL device, 0"
                    : "there are " + std::to_string(count) + " OpenCL devices, 0.." +
                          std::to_string(count - 1);
}

// Lists the devices in a child process. What the runtime prints there as it fails is left out:
// the reason reaches the user once, as the tool's own message.
Status ProbeRuntime() {
  std::fflush(stdout);
  std::fflush(stderr);
  const pid_t child = fork();
  if (child < 0) return Status::Error(std::string("cannot start a process: ") + strerror(errno));
  if (child == 0) {
    const int null = open("/dev/null", O_WRONLY);
    if (null >= 0) {
      dup2(null, STDOUT_FILENO);
      dup2(null, STDERR_FILENO);
    }
    uint32_t count = 0;
    NLECommon::ListOpenCLDevices(nullptr, 0, &count);
    _exit(0);
  }
  int status = 0;
  while (waitpid(child, &status, 0) < 0) {
    if (errno != EINTR) return Status::Error(std::string("cannot wait: ") + strerror(errno));
  }
  if (WIFSIGNALED(status)) {
    return Status::Error(std::string("the OpenCL runtime crashed while starting (") +
                         strsignal(WTERMSIG(status)) +
                         "); --no-opencl or TESSAROFX_NO_OPENCL=1 keeps the tool away from it");
  }
  if (!WIFEXITED(status) || WEXITSTATUS(status) != 0) {
    return Status::Error("the OpenCL runtime failed while starting (exit status " +
                         std::to_string(WEXITSTATUS(status)) + ")");
  }
  return Status::Ok();
}

}  // namespace

Status CheckOpenCLUsable(bool turnedOff) {
  if (turnedOff) return Status::Error("OpenCL is turned off (--no-opencl)");
  if (const char* off = std::getenv("TESSAROFX_NO_OPENCL"); off && *off && std::strcmp(off, "0")) {
    return Status::Error(std::string("OpenCL is turned off (TESSAROFX_NO_OPENCL=") + off + ")");
  }
  static const Status probed = ProbeRuntime();
  return probed;
}

Status ListDevices(std::vector<NLEOpenCLDeviceInfo>* devices) {
  uint32_t count = 0;
  HRESULT hr = NLECommon::ListOpenCLDevices(nullptr, 0, &count);
  // A runtime may add a device between the two calls; the second count is the one filled in.
  if (NLE_SUCCEEDED(hr) && count > 0) {
    devices->resize(count);
    hr = NLECommon::ListOpenCLDevices(devices->data(), count, &count);
  }
  if (NLE_FAILED(hr)) {
    devices->clear();
    return Status::Error("cannot list the OpenCL devices: " + DescribeResult(hr), hr);
  }
  devices->resize(std::min<size_t>(count, devices->size()));
  return Status::Ok();
}

const char* DeviceTypeName(uint64_t type) {
  if (type & kTypeGpu) return "GPU";
  if (type & kTypeCpu) return "CPU";
  if (type & kTypeAccelerator) return "accelerator";
  return "other";
}

// The kit does not say which device it would pick, so its rule is repeated here; the devices
// test holds the two together through the environment variable.
int DefaultDeviceIndex(const std::vector<NLEOpenCLDeviceInfo>& devices, std::string* why) {
  if (devices.empty()) return -1;
  if (const char* chosen = std::getenv("TESSAROFX_OPENCL_DEVICE"); chosen && *chosen) {
    long long index = 0;
    if (!ParseInteger(chosen, &index) || index < 0 ||
        index >= static_cast<long long>(devices.size())) {
      if (why) {
        *why = std::string("TESSAROFX_OPENCL_DEVICE='") + chosen + "' names no device (" +
               Range(devices.size()) + ")";
      }
      return -1;
    }
    return static_cast<int>(index);
  }
  for (uint64_t wanted : {kTypeGpu, kTypeCpu}) {
    for (size_t i = 0; i < devices.size(); ++i) {
      if (devices[i].type & wanted) return static_cast<int>(i);
    }
  }
  return 0;
}

Status OpenDevice(int index, NLEComPtr<INLECGDevice>& device, std::string* name) {
  std::vector<NLEOpenCLDeviceInfo> devices;
  if (Status s = ListDevices(&devices); !s.ok()) return s;
  if (devices.empty()) {
    return Status::Error(
        "no OpenCL device: no OpenCL platform was found, or none has a device (see tessarofx "
        "devices)");
  }
  if (index < -1 || index >= static_cast<int>(devices.size())) {
    return Status::Error("--device " + std::to_string(index) +
                         " is out of range: " + Range(devices.size()) + " (see tessarofx devices)");
  }
  // -1 goes to the kit as it is, so the tool opens what any other host would get.
  const HRESULT hr = NLECommon::CreateOpenCLDevice(index, &device);
  if (NLE_FAILED(hr) || !device) {
    std::string why;
    const int chosen = index == -1 ? DefaultDeviceIndex(devices, &why) : index;
    if (chosen < 0) return Status::Error(why + "; unset it or pass --device N", hr);
    return Status::Error("cannot open OpenCL device " + std::to_string(chosen) + " (" +
                             devices[chosen].device + "): " + DescribeResult(hr),
                         hr);
  }
  wchar_t buf[256] = {};
  if (name && NLE_SUCCEEDED(device->GetName(buf, 256))) *name = Narrow(buf);
  return Status::Ok();
}

}  // namespace tfxtool
