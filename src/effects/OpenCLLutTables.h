// A CubeLut on the device for the "LUT" program's kernel "MAIN": its whole float lattice and its
// two per-byte tables as read-only buffers, and the kernel arguments that name them. Shared by
// the OpenCL LUT and chroma-key effects.
#pragma once

#include "tessarofx/CubeLut.h"
#include "tessarofx/NLEOpenCL.h"

struct DeviceLutTables {
  OPENCL::openclMemory* lattice = nullptr;
  OPENCL::openclMemory* fraction = nullptr;
  OPENCL::openclMemory* grid = nullptr;
};

// What the kernel's arguments 5 and 6 carry: the lattice's points per axis as stored and floats
// per point. The lattice always goes up whole, whatever N, so these never change.
constexpr int32_t kLutLatticeAxis = 64;
constexpr int32_t kLutLatticePoint = 3;

// Frees the three buffers, then uploads the table's 64x64x64x3 float lattice and its fraction
// and grid index tables (256 entries each). True only when all three were made.
bool UploadDeviceLut(OPENCL::openclMemManager* memory, CubeLut& table, DeviceLutTables* device);
void ReleaseDeviceLut(OPENCL::openclMemManager* memory, DeviceLutTables* device);

// Arguments 2, 3, 4 (the buffers) and 7 (N); false when any is refused.
bool SetDeviceLutArgs(OPENCL::openclKernel* kernel, const DeviceLutTables& device, int32_t n);
