// The storage object a frame hands out through INLEFrame::GetBuffer. It records the layout of
// the storage at the time it was asked for: a frame that is reallocated afterwards has new
// storage, and its callers ask again.

#include "HostInternal.h"

namespace tfx::host {
namespace {

class FrameBuffer final : public scombase::CUnknown, public INLEFrameBuffer {
 public:
  FrameBuffer(int32_t stride, int32_t size)
      : CUnknown(L"NLEFrameBuffer", nullptr), stride_(stride), size_(size) {}

  NLE_DECLARE_IUNKNOWN

  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override {
    if (!out) return NLE_E_POINTER;
    if (iid == IID_INLEFrameBuffer) return GetInterface(static_cast<INLEFrameBuffer*>(this), out);
    return CUnknown::NonDelegatingQueryInterface(iid, out);
  }

  int32_t GetStride() override { return stride_; }
  int32_t GetSize() override { return size_; }

 private:
  const int32_t stride_;
  const int32_t size_;
};

}  // namespace

HRESULT CreateFrameBuffer(int32_t stride, int32_t size, INLEFrameBuffer** out) {
  if (!out) return NLE_E_POINTER;
  *out = nullptr;
  return CallGuarded([&] {
    auto* buffer = new FrameBuffer(stride, size);
    buffer->NonDelegatingAddRef();
    *out = buffer;
    return NLE_S_OK;
  });
}

}  // namespace tfx::host
