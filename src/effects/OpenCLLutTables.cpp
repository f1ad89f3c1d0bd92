#include "effects/OpenCLLutTables.h"

namespace {

constexpr int kLatticeBytes = kLutLatticeAxis * kLutLatticeAxis * kLutLatticeAxis *
                              kLutLatticePoint * static_cast<int>(sizeof(float));
constexpr int kByteTableBytes = 256 * 4;

bool Upload(OPENCL::openclMemManager* memory, const void* data, int bytes,
            OPENCL::openclMemory** out) {
  if (!memory->createOpenCLMem(OPENCL::kMemParamBlock, bytes, data, out)) {
    *out = nullptr;
    return false;
  }
  return true;
}

bool SetMemory(OPENCL::openclKernel* kernel, int index, OPENCL::openclMemory* memory) {
  return kernel->setKernelParameters(index, OPENCL::kDataMemory, &memory, sizeof memory);
}

}  // namespace

void ReleaseDeviceLut(OPENCL::openclMemManager* memory, DeviceLutTables* device) {
  for (OPENCL::openclMemory** m : {&device->lattice, &device->fraction, &device->grid}) {
    if (*m && memory) memory->releaseOpenCLMem(*m);
    *m = nullptr;
  }
}

bool UploadDeviceLut(OPENCL::openclMemManager* memory, CubeLut& table, DeviceLutTables* device) {
  ReleaseDeviceLut(memory, device);
  if (!memory) return false;
  const bool lattice = Upload(memory, table.getLut3DData(nullptr, nullptr, nullptr, nullptr),
                              kLatticeBytes, &device->lattice);
  const bool fraction =
      Upload(memory, table.getFTData(nullptr), kByteTableBytes, &device->fraction);
  const bool grid = Upload(memory, table.getGTData(nullptr), kByteTableBytes, &device->grid);
  return lattice && fraction && grid;
}

bool SetDeviceLutArgs(OPENCL::openclKernel* kernel, const DeviceLutTables& device, int32_t n) {
  return SetMemory(kernel, 2, device.lattice) && SetMemory(kernel, 3, device.fraction) &&
         SetMemory(kernel, 4, device.grid) &&
         kernel->setKernelParameters(7, OPENCL::kDataScalar, &n, sizeof n);
}
