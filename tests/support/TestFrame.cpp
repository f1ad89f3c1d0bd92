#include "support/TestFrame.h"

namespace {

class Buffer final : public scombase::CUnknown, public INLEFrameBuffer {
 public:
  Buffer(int32_t stride, int32_t size)
      : CUnknown(L"TestBuffer", nullptr), stride_(stride), size_(size) {}
  NLE_DECLARE_IUNKNOWN
  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override {
    if (iid == IID_INLEFrameBuffer) return GetInterface(static_cast<INLEFrameBuffer*>(this), out);
    return CUnknown::NonDelegatingQueryInterface(iid, out);
  }
  int32_t GetStride() override { return stride_; }
  int32_t GetSize() override { return size_; }

 private:
  int32_t stride_;
  int32_t size_;
};

class Surface final : public scombase::CUnknown, public INLEFrameSurface {
 public:
  Surface(TestFrame* frame) : CUnknown(L"TestSurface", nullptr), frame_(frame) {}
  NLE_DECLARE_IUNKNOWN
  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override {
    if (iid == IID_INLEFrameSurface) return GetInterface(static_cast<INLEFrameSurface*>(this), out);
    return CUnknown::NonDelegatingQueryInterface(iid, out);
  }
  NLESurfaceKind GetKind() override { return frame_->surfaceKind; }
  uint8_t* GetMappedPixels() override { return frame_->pixels.data(); }
  void* GetDeviceMemory() override { return frame_->deviceMemory; }

 private:
  TestFrame* frame_;
};

}  // namespace

TestFrame::TestFrame(int w, int h, int s, bool surface, uint8_t fill)
    : CUnknown(L"TestFrame", nullptr),
      width(w),
      height(h),
      stride(s ? s : w * 4),
      useSurface(surface),
      pixels(static_cast<size_t>(stride) * static_cast<size_t>(h), fill) {}

HRESULT TestFrame::NonDelegatingQueryInterface(REFIID iid, void** out) {
  if (iid == IID_INLEFrame) return GetInterface(static_cast<INLEFrame*>(this), out);
  return CUnknown::NonDelegatingQueryInterface(iid, out);
}

HRESULT TestFrame::GetDescription(NLEFrameDesc* desc, bool, bool) {
  desc->width = width;
  desc->height = height;
  desc->orientation = kNLEFrameTopDown;
  desc->storage = useSurface ? kNLEFrameStorageSurface : kNLEFrameStorageMemory;
  return NLE_S_OK;
}

HRESULT TestFrame::GetBuffer(INLEFrameBuffer** buffer) {
  *buffer = new Buffer(stride, static_cast<int32_t>(pixels.size()));
  (*buffer)->AddRef();
  return NLE_S_OK;
}

HRESULT TestFrame::GetPixels(uint8_t** out) {
  if (useSurface) return NLE_E_NOTIMPL;
  *out = pixels.data();
  return NLE_S_OK;
}

HRESULT TestFrame::GetSurface(INLEFrameSurface** surface) {
  if (!useSurface) return NLE_E_NOTIMPL;
  *surface = new Surface(this);
  (*surface)->AddRef();
  return NLE_S_OK;
}

HRESULT TestFrame::ReleaseSurface(INLEFrameSurface*) {
  ++surfaceReleases;
  return NLE_S_OK;
}

HRESULT TestFrame::Prepare() {
  ++prepareCalls;
  return NLE_S_OK;
}
