// Frames whose pixels live in device memory. Filters reach the memory through the frame's
// surface; hosts move pixels in and out with Upload and Download.

#include <cstring>
#include <vector>

#include "HostInternal.h"
#include "OpenCLInternal.h"

namespace tfx::host {
namespace {

// The surface of a device frame. It holds the frame, so the memory stays valid while a filter
// holds the surface.
class OpenCLSurface final : public scombase::CUnknown, public INLEFrameSurface {
 public:
  OpenCLSurface(INLEFrame* frame, OPENCL::openclMemory* memory)
      : CUnknown(L"NLEOpenCLSurface", nullptr), frame_(frame), memory_(memory) {}

  NLE_DECLARE_IUNKNOWN

  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override {
    if (!out) return NLE_E_POINTER;
    if (iid == IID_INLEFrameSurface) return GetInterface(static_cast<INLEFrameSurface*>(this), out);
    return CUnknown::NonDelegatingQueryInterface(iid, out);
  }

  NLESurfaceKind GetKind() override { return kNLESurfaceOpenCL; }
  // Device surfaces are never mapped into CPU memory.
  uint8_t* GetMappedPixels() override { return nullptr; }
  void* GetDeviceMemory() override { return memory_; }

 private:
  NLEComPtr<INLEFrame> frame_;
  OPENCL::openclMemory* memory_;
};

class OpenCLFrame final : public scombase::CUnknown, public INLEOpenCLFrame {
 public:
  OpenCLFrame(INLECGDevice* device, OPENCL::openclMemManager* manager)
      : CUnknown(L"NLEOpenCLFrame", nullptr), device_(device), manager_(manager) {}
  ~OpenCLFrame() override { manager_->releaseOpenCLMem(memory_); }

  NLE_DECLARE_IUNKNOWN

  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override {
    if (!out) return NLE_E_POINTER;
    INLEOpenCLFrame* self = this;
    if (iid == IID_INLEOpenCLFrame) return GetInterface(self, out);
    if (iid == IID_INLEFrame) return GetInterface(static_cast<INLEFrame*>(self), out);
    return CUnknown::NonDelegatingQueryInterface(iid, out);
  }

  HRESULT Allocate(int32_t width, int32_t height, OPENCL::MemoryKind kind) {
    return manager_->createOpenCLFrameMem(width, height, kind, nullptr, 0, &memory_)
               ? NLE_S_OK
               : NLE_E_RESOURCE;
  }

  // The device keeps the memory in place whatever the caller intends, so the hints are unused.
  HRESULT GetDescription(NLEFrameDesc* desc, bool /*forWrite*/, bool /*flip*/) override {
    if (!desc) return NLE_E_POINTER;
    const OPENCL::openclMemoryInfo info = memory_->getOpenCLMemoryInfo();
    desc->width = info.width;
    desc->height = info.height;
    desc->orientation = kNLEFrameTopDown;
    desc->storage = kNLEFrameStorageSurface;
    return NLE_S_OK;
  }

  HRESULT GetBuffer(INLEFrameBuffer** buffer) override {
    const OPENCL::openclMemoryInfo info = memory_->getOpenCLMemoryInfo();
    return CreateFrameBuffer(static_cast<int32_t>(info.rowPitch), static_cast<int32_t>(info.size),
                             buffer);
  }

  HRESULT GetPixels(uint8_t** pixels) override {
    if (pixels) *pixels = nullptr;
    return NLE_E_NOTIMPL;
  }

  HRESULT GetSurface(INLEFrameSurface** surface) override {
    if (!surface) return NLE_E_POINTER;
    *surface = nullptr;
    return CallGuarded([&] {
      auto* made = new OpenCLSurface(static_cast<INLEFrame*>(this), memory_);
      made->NonDelegatingAddRef();
      *surface = made;
      return NLE_S_OK;
    });
  }

  // Kernels wrote the device memory itself, so there is nothing to commit.
  HRESULT ReleaseSurface(INLEFrameSurface* surface) override {
    return surface ? NLE_S_OK : NLE_E_POINTER;
  }

  // The memory exists (zeroed) from creation on.
  HRESULT Prepare() override { return NLE_S_OK; }

  HRESULT Upload(const uint8_t* bgra, int32_t stride) override {
    return Move(const_cast<uint8_t*>(bgra), stride, true);
  }
  HRESULT Download(uint8_t* bgra, int32_t stride) override { return Move(bgra, stride, false); }

 private:
  HRESULT Move(uint8_t* bgra, int32_t stride, bool upload) {
    if (!bgra) return NLE_E_POINTER;
    const OPENCL::openclMemoryInfo info = memory_->getOpenCLMemoryInfo();
    if (stride < 0 || (stride > 0 && static_cast<size_t>(stride) < info.rowPitch)) {
      return NLE_E_INVALIDARG;
    }
    auto* bytes = reinterpret_cast<char*>(bgra);
    const size_t hostPitch = stride == 0 ? info.rowPitch : static_cast<size_t>(stride);
    bool moved = true;
    if (hostPitch == info.rowPitch) {
      moved = upload ? memory_->writeData2OpenCLMemory(bytes, info.size, 0, true, nullptr)
                     : memory_->readDataFromOpenCLMemory(bytes, info.size, 0, true, nullptr);
    } else {
      // Row by row, so the caller's padding is neither sent nor overwritten.
      for (int32_t y = 0; moved && y < info.height; ++y) {
        char* row = bytes + y * hostPitch;
        const size_t at = y * info.rowPitch;
        moved = upload ? memory_->writeData2OpenCLMemory(row, info.rowPitch, at, true, nullptr)
                       : memory_->readDataFromOpenCLMemory(row, info.rowPitch, at, true, nullptr);
      }
    }
    return moved ? NLE_S_OK : NLE_E_RESOURCE;
  }

  NLEComPtr<INLECGDevice> device_;  // keeps the managers alive
  OPENCL::openclMemManager* manager_;
  OPENCL::openclMemory* memory_ = nullptr;
};

}  // namespace
}  // namespace tfx::host

namespace NLECommon {

HRESULT CreateOpenCLFrame(INLECGDevice* device, int32_t width, int32_t height,
                          OPENCL::MemoryKind kind, INLEOpenCLFrame** out) {
  using namespace tfx::host;
  if (!out) return NLE_E_POINTER;
  *out = nullptr;
  if (!device) return NLE_E_INVALIDARG;
  if (width < 1 || height < 1 || int64_t{width} * 4 * height > INT32_MAX) return NLE_E_INVALIDARG;
  if (kind != OPENCL::kMemoryFrameBuffer && kind != OPENCL::kMemoryImage2D) {
    return NLE_E_INVALIDARG;
  }
  NLEComPtr<INLECGOpenCLOperate> operate;
  if (NLE_FAILED(
          device->QueryInterface(IID_INLECGOpenCLOperate, reinterpret_cast<void**>(&operate)))) {
    return NLE_E_INVALIDARG;
  }
  void* programs = nullptr;
  void* memory = nullptr;
  if (NLE_FAILED(operate->GetOpenCLHandles(&programs, &memory)) || !memory) {
    return NLE_E_RESOURCE;
  }
  return CallGuarded([&] {
    auto* frame = new OpenCLFrame(device, static_cast<OPENCL::openclMemManager*>(memory));
    frame->NonDelegatingAddRef();
    const HRESULT hr = frame->Allocate(width, height, kind);
    if (NLE_FAILED(hr)) {
      frame->NonDelegatingRelease();
      return hr;
    }
    *out = frame;
    return NLE_S_OK;
  });
}

}  // namespace NLECommon
