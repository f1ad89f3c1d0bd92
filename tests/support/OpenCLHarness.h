// Effects on a real OpenCL device: the default device of the machine (PoCL's CPU device where
// nothing else is installed), filters created on it the way a host does, and frames moved to
// and from its memory. Tests using it skip, saying why, on a machine without any OpenCL device.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <vector>

#include "support/ImageBuilders.h"
#include "support/ScopedVariable.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/NLEOpenCL.h"
#include "tessarofx/TessaroFx.h"

namespace tfx_test {

// What the machine's OpenCL runtimes list, in the kit's order.
inline std::vector<NLEOpenCLDeviceInfo> OpenCLDevices() {
  uint32_t count = 0;
  if (NLECommon::ListOpenCLDevices(nullptr, 0, &count) != NLE_S_OK) return {};
  std::vector<NLEOpenCLDeviceInfo> devices(count);
  NLECommon::ListOpenCLDevices(devices.data(), count, &count);
  devices.resize(std::min<size_t>(count, devices.size()));
  return devices;
}

// The device's program manager and memory manager, as filters get them.
void OpenCLHandles(INLECGDevice* device, OPENCL::openclProgramManager** programs,
                   OPENCL::openclMemManager** memory);

class OpenCLEffectTest : public testing::Test {
 protected:
  void SetUp() override;

  // The OpenCL class of `guid` built with the shipped kernels; a failure fails the test.
  NLEComPtr<INLECGFilter> CreateOnDevice(const wchar_t* guid, INLEProperties* settings);
  // A width x height frame in device memory holding `bgra` (packed), or zeros.
  NLEComPtr<INLEOpenCLFrame> DeviceFrame(int width, int height, const Bytes& bgra = {});
  static Bytes Download(INLEOpenCLFrame* frame);
  void Handles(OPENCL::openclProgramManager** programs, OPENCL::openclMemManager** memory) {
    OpenCLHandles(device_.get(), programs, memory);
  }

  // One frame through a filter as a host runs it: `src` (width x height, packed BGRA) becomes the
  // foreground, the destination starts as `dstFill` bytes. The status lands in *status.
  Bytes RunOnDevice(INLECGFilter* filter, const Bytes& src, int width, int height,
                    HRESULT* status = nullptr, uint8_t dstFill = 0);
  // The same frame through a CPU class, in memory frames.
  static Bytes RunOnCpu(INLECGFilter* filter, const Bytes& src, int width, int height);

  ScopedVariable choice_{"TESSAROFX_OPENCL_DEVICE", nullptr};
  NLEComPtr<INLECGDevice> device_;
};

// Largest per-byte difference, and how many bytes differ.
struct ByteDiff {
  int largest = 0;
  size_t count = 0;
};
ByteDiff CompareBytes(const Bytes& a, const Bytes& b);

}  // namespace tfx_test
