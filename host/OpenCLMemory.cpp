// Device memory: plain buffers, the plug-in's parameter block, and BGRA frames kept either as a
// buffer or as a 2D image.

#include <cstring>
#include <new>
#include <vector>

#include "OpenCLInternal.h"

namespace tfx::host {
namespace {

constexpr size_t kBytesPerPixel = 4;

// The runtime's flags for a memory type, or 0 for a type we do not make.
cl_mem_flags FlagsOf(OPENCL::MemoryType type) {
  switch (type) {
    case OPENCL::kMemBufferReadWrite:
      return CL_MEM_READ_WRITE;
    case OPENCL::kMemBufferReadOnly:
    case OPENCL::kMemParamBlock:
      return CL_MEM_READ_ONLY;
    case OPENCL::kMemBufferWriteOnly:
      return CL_MEM_WRITE_ONLY;
  }
  return 0;
}

const cl::ImageFormat kBgra8(CL_BGRA, CL_UNORM_INT8);

}  // namespace

bool OpenCLMemory::Transfer(char* data, size_t size, size_t offset, bool blocking,
                            cl_command_queue queue, bool write) {
  if (!data || size == 0 || offset > info_.size || size > info_.size - offset) return false;
  // A queue the caller passes stays the caller's: wrapping it must not take its reference away.
  cl::CommandQueue q = queue ? cl::CommandQueue(queue, true) : queue_;
  const cl_bool block = blocking ? CL_TRUE : CL_FALSE;
  cl_int err = CL_SUCCESS;
  if (info_.kind == OPENCL::kMemoryImage2D) {
    // Images move in whole rows, packed at the row pitch the frame reports.
    if (offset % info_.rowPitch != 0 || size % info_.rowPitch != 0) return false;
    const cl::Image2D image(memory_(), true);
    const cl::array<cl::size_type, 3> origin{0, offset / info_.rowPitch, 0};
    const cl::array<cl::size_type, 3> region{static_cast<size_t>(info_.width),
                                             size / info_.rowPitch, 1};
    err = write ? q.enqueueWriteImage(image, block, origin, region, info_.rowPitch, 0, data)
                : q.enqueueReadImage(image, block, origin, region, info_.rowPitch, 0, data);
  } else {
    const cl::Buffer buffer(memory_(), true);
    err = write ? q.enqueueWriteBuffer(buffer, block, offset, size, data)
                : q.enqueueReadBuffer(buffer, block, offset, size, data);
  }
  return err == CL_SUCCESS;
}

bool OpenCLMemory::writeData2OpenCLMemory(const char* data, size_t size, size_t offset,
                                          bool blocking, cl_command_queue queue) {
  // The runtime only reads from `data` on a write.
  return Transfer(const_cast<char*>(data), size, offset, blocking, queue, true);
}

bool OpenCLMemory::readDataFromOpenCLMemory(char* data, size_t size, size_t offset, bool blocking,
                                            cl_command_queue queue) {
  return Transfer(data, size, offset, blocking, queue, false);
}

bool OpenCLMemory::copyToMemory(OPENCL::openclMemory* source, bool copy) {
  if (copy && source) return copyFromMemory(source);
  // Filling (clEnqueueFill*) would need the runtime's 1.2 fill support for images in every
  // driver; a zeroed host copy works everywhere and frames are cleared rarely.
  try {
    std::vector<char> zeros(info_.size, 0);
    return writeData2OpenCLMemory(zeros.data(), zeros.size(), 0, true, nullptr);
  } catch (const std::bad_alloc&) {
    return false;
  }
}

bool OpenCLMemory::copyFromMemory(OPENCL::openclMemory* source) {
  if (!source) return false;
  const OPENCL::openclMemoryInfo from = source->getOpenCLMemoryInfo();
  if (from.kind != info_.kind || from.width != info_.width || from.height != info_.height ||
      from.size != info_.size) {
    return false;
  }
  const auto* other = static_cast<OpenCLMemory*>(source);
  cl_int err = CL_SUCCESS;
  if (info_.kind == OPENCL::kMemoryImage2D) {
    const cl::array<cl::size_type, 3> origin{0, 0, 0};
    const cl::array<cl::size_type, 3> region{static_cast<size_t>(info_.width),
                                             static_cast<size_t>(info_.height), 1};
    err = queue_.enqueueCopyImage(cl::Image2D(other->memory_(), true), cl::Image2D(memory_(), true),
                                  origin, origin, region);
  } else {
    err = queue_.enqueueCopyBuffer(cl::Buffer(other->memory_(), true), cl::Buffer(memory_(), true),
                                   0, 0, info_.size);
  }
  return err == CL_SUCCESS && queue_.finish() == CL_SUCCESS;
}

bool OpenCLMemManager::createOpenCLMem(OPENCL::MemoryType type, int size, const void* init,
                                       OPENCL::openclMemory** out) {
  if (!out) return false;
  *out = nullptr;
  cl_mem_flags flags = FlagsOf(type);
  if (flags == 0 || size < 1 || (type == OPENCL::kMemParamBlock && !init)) return false;
  if (init) flags |= CL_MEM_COPY_HOST_PTR;
  cl_int err = CL_SUCCESS;
  cl::Buffer buffer(cl_.context, flags, static_cast<size_t>(size), const_cast<void*>(init), &err);
  if (err != CL_SUCCESS) return false;
  const OPENCL::openclMemoryInfo info{size, 1, static_cast<size_t>(size), static_cast<size_t>(size),
                                      OPENCL::kMemoryBuffer};
  *out = new (std::nothrow) OpenCLMemory(cl_, std::move(buffer), info);
  return *out != nullptr;
}

bool OpenCLMemManager::createOpenCLFrameMem(int width, int height, OPENCL::MemoryKind kind,
                                            const void* bgra, int stride,
                                            OPENCL::openclMemory** out) {
  if (!out) return false;
  *out = nullptr;
  if (width < 1 || height < 1 || stride < 0) return false;
  if (kind != OPENCL::kMemoryFrameBuffer && kind != OPENCL::kMemoryImage2D) return false;
  const size_t pitch = static_cast<size_t>(width) * kBytesPerPixel;
  const size_t hostPitch = stride == 0 ? pitch : static_cast<size_t>(stride);
  if (hostPitch < pitch) return false;
  const OPENCL::openclMemoryInfo info{width, height, pitch, pitch * static_cast<size_t>(height),
                                      kind};
  cl_int err = CL_SUCCESS;
  cl::Memory memory;
  if (kind == OPENCL::kMemoryImage2D) {
    memory = cl::Image2D(cl_.context, CL_MEM_READ_WRITE, kBgra8, static_cast<size_t>(width),
                         static_cast<size_t>(height), 0, nullptr, &err);
  } else {
    memory = cl::Buffer(cl_.context, CL_MEM_READ_WRITE, info.size, nullptr, &err);
  }
  if (err != CL_SUCCESS) return false;
  auto* made = new (std::nothrow) OpenCLMemory(cl_, std::move(memory), info);
  if (!made) return false;
  bool filled = false;
  if (!bgra) {
    filled = made->copyToMemory(nullptr, false);
  } else if (hostPitch == pitch) {
    filled =
        made->writeData2OpenCLMemory(static_cast<const char*>(bgra), info.size, 0, true, nullptr);
  } else {
    // Rows go one at a time, so the caller's padding never reaches the device.
    filled = true;
    const auto* rows = static_cast<const char*>(bgra);
    for (int y = 0; filled && y < height; ++y) {
      filled = made->writeData2OpenCLMemory(rows + y * hostPitch, pitch, y * pitch, true, nullptr);
    }
  }
  if (!filled) {
    delete made;
    return false;
  }
  *out = made;
  return true;
}

void OpenCLMemManager::releaseOpenCLMem(OPENCL::openclMemory* memory) {
  delete static_cast<OpenCLMemory*>(memory);
}

}  // namespace tfx::host
