// Frames whose pixels live in CPU memory, either the frame's own (allocated on first use, so a
// host can describe many frames and pay only for those that get pixels) or the caller's.
//
// Device frames answer GetSurface/ReleaseSurface instead of GetPixels; they share this file's
// layout rules and the storage object of FrameBuffer.cpp, and differ only in where pixels live.

#include <cstdlib>
#include <cstring>
#include <memory>

#include "HostInternal.h"

namespace tfx::host {
namespace {

// Rows start on cache-line boundaries when the stride allows it, which vector code likes.
constexpr size_t kAlignment = 64;

struct FreeDeleter {
  void operator()(uint8_t* p) const { std::free(p); }
};

struct Layout {
  int32_t width = 0;
  int32_t height = 0;
  int32_t stride = 0;
  int32_t size = 0;  // bytes; 0 for a frame without pixels
  NLEFrameOrientation orientation = kNLEFrameTopDown;
};

// Checks a requested layout. Sizes must fit the int32 fields the frame interfaces report them in.
HRESULT MakeLayout(int32_t width, int32_t height, int32_t stride, NLEFrameOrientation orientation,
                   Layout* layout) {
  if (width < 0 || height < 0 || stride < 0) return NLE_E_INVALIDARG;
  if (orientation != kNLEFrameTopDown && orientation != kNLEFrameBottomUp) {
    return NLE_E_INVALIDARG;
  }
  const int64_t packed = int64_t{width} * 4;
  if (packed > INT32_MAX) return NLE_E_INVALIDARG;
  const int64_t rowBytes = stride == 0 ? packed : stride;
  if (rowBytes < packed) return NLE_E_INVALIDARG;
  const int64_t size = width == 0 || height == 0 ? 0 : rowBytes * height;
  if (size > INT32_MAX) return NLE_E_INVALIDARG;
  layout->width = width;
  layout->height = height;
  layout->stride = static_cast<int32_t>(rowBytes);
  layout->size = static_cast<int32_t>(size);
  layout->orientation = orientation;
  return NLE_S_OK;
}

class MemoryFrame final : public scombase::CUnknown, public INLEMemoryFrame {
 public:
  explicit MemoryFrame(IUnknown* outer) : CUnknown(L"NLEMemoryFrame", outer) {}

  NLE_DECLARE_IUNKNOWN

  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override {
    if (!out) return NLE_E_POINTER;
    INLEMemoryFrame* self = this;
    if (iid == IID_INLEMemoryFrame) return GetInterface(self, out);
    if (iid == IID_INLEFrame) return GetInterface(static_cast<INLEFrame*>(self), out);
    return CUnknown::NonDelegatingQueryInterface(iid, out);
  }

  HRESULT Allocate(int32_t width, int32_t height, int32_t stride,
                   NLEFrameOrientation orientation) override {
    Layout layout;
    if (HRESULT hr = MakeLayout(width, height, stride, orientation, &layout); NLE_FAILED(hr)) {
      return hr;
    }
    storage_.reset();
    wrapped_ = nullptr;
    layout_ = layout;
    return NLE_S_OK;
  }

  HRESULT Wrap(uint8_t* pixels, int32_t width, int32_t height, int32_t stride,
               NLEFrameOrientation orientation) override {
    Layout layout;
    if (HRESULT hr = MakeLayout(width, height, stride, orientation, &layout); NLE_FAILED(hr)) {
      return hr;
    }
    if (!pixels && layout.size > 0) return NLE_E_POINTER;
    storage_.reset();
    wrapped_ = pixels;
    layout_ = layout;
    return NLE_S_OK;
  }

  // Memory frames need no preparation for reading or writing, so the two hints are unused.
  HRESULT GetDescription(NLEFrameDesc* desc, bool /*forWrite*/, bool /*flip*/) override {
    if (!desc) return NLE_E_POINTER;
    desc->width = layout_.width;
    desc->height = layout_.height;
    desc->orientation = layout_.orientation;
    desc->storage = kNLEFrameStorageMemory;
    return NLE_S_OK;
  }

  HRESULT GetBuffer(INLEFrameBuffer** buffer) override {
    return CreateFrameBuffer(layout_.stride, layout_.size, buffer);
  }

  HRESULT GetPixels(uint8_t** pixels) override {
    if (!pixels) return NLE_E_POINTER;
    *pixels = nullptr;
    if (HRESULT hr = EnsureStorage(); NLE_FAILED(hr)) return hr;
    *pixels = Pixels();
    return NLE_S_OK;
  }

  HRESULT GetSurface(INLEFrameSurface** surface) override {
    if (surface) *surface = nullptr;
    return NLE_E_NOTIMPL;
  }

  HRESULT ReleaseSurface(INLEFrameSurface* /*surface*/) override { return NLE_E_NOTIMPL; }

  HRESULT Prepare() override { return EnsureStorage(); }

 private:
  uint8_t* Pixels() const {
    if (layout_.size == 0) return nullptr;
    return wrapped_ ? wrapped_ : storage_.get();
  }

  HRESULT EnsureStorage() {
    if (layout_.size == 0 || wrapped_ || storage_) return NLE_S_OK;
    const size_t bytes = static_cast<size_t>(layout_.size);
    const size_t rounded = (bytes + kAlignment - 1) / kAlignment * kAlignment;
    auto* p = static_cast<uint8_t*>(std::aligned_alloc(kAlignment, rounded));
    if (!p) return NLE_E_OUTOFMEMORY;
    std::memset(p, 0, bytes);
    storage_.reset(p);
    return NLE_S_OK;
  }

  Layout layout_;
  uint8_t* wrapped_ = nullptr;  // the caller's memory, when the frame wraps it
  std::unique_ptr<uint8_t, FreeDeleter> storage_;
};

}  // namespace

scombase::CUnknown* NewMemoryFrame(IUnknown* outer) { return new MemoryFrame(outer); }

}  // namespace tfx::host
