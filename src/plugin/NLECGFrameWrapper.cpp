#include "plugin/NLECGFrameWrapper.h"

#include <cstddef>
#include <cstring>
#include <new>

namespace {

int32_t RoundHalfUp(double v) { return static_cast<int32_t>(v + 0.5); }

}  // namespace

NLECGFrameWrapper::NLECGFrameWrapper(INLEFrame* f, bool wb, bool fl, NLERectF roi)
    : frame(f), writeBack(wb), flip(fl) {
  if (!frame) return;

  NLEFrameDesc desc{};
  if (frame->GetDescription(&desc, writeBack, flip) < 0) return;
  const int32_t W = desc.width;
  const int32_t H = desc.height;

  int32_t rx = RoundHalfUp(roi.x * W);
  int32_t ry = RoundHalfUp(roi.y * H);
  int32_t rw = RoundHalfUp(roi.width * W);
  int32_t rh = RoundHalfUp(roi.height * H);
  if (rx + rw > W) rw = W - rx;
  if (ry + rh > H) rh = H - ry;
  if (rx < 0) rx = 0;
  if (ry < 0) ry = 0;
  if (rx + rw > W || ry + rh > H) {
    rx = 0;
    ry = 0;
    rw = W;
    rh = H;
  }

  NLEComPtr<INLEFrameBuffer> buffer;
  int32_t stride = 0;
  if (frame->GetBuffer(&buffer) >= 0 && buffer) stride = buffer->GetStride();
  buffer.Reset();
  if (stride == 0 || rw <= 0 || rh <= 0) return;

  const bool needCopy = !(rw == W && rh == H && !flip && stride == rw * 4);

  uint8_t* base = nullptr;
  if (desc.storage == kNLEFrameStorageMemory) {
    frame->GetPixels(&base);
  } else if (desc.storage == kNLEFrameStorageSurface) {
    if (frame->GetSurface(&surface) >= 0 && surface) base = surface->GetMappedPixels();
  }
  if (!base) return;

  if (flip) {
    base += static_cast<ptrdiff_t>(H - 1) * stride;
    stride = -stride;
    ry = H - rh - ry;
  }

  x = rx;
  y = ry;
  width = rw;
  height = rh;
  frameBase = base;
  frameStride = stride;
  pitch = rw * 4;

  if (!needCopy) {
    data = base;
    return;
  }
  data = new (std::nothrow) uint8_t[static_cast<size_t>(height) * static_cast<size_t>(pitch)];
  if (!data) {
    width = height = pitch = 0;
    return;
  }
  copied = true;
  CopyRegion(data, false);
}

NLECGFrameWrapper::~NLECGFrameWrapper() {
  if (copied && writeBack && data) CopyRegion(data, true);
  if (surface) {
    frame->ReleaseSurface(surface);
    surface->Release();
  }
  if (copied) delete[] data;
}

// Moves the region's rows between the private buffer and the frame (the frame's rows start at
// base + x * 4 + y * stride and step by the possibly negative stride).
void NLECGFrameWrapper::CopyRegion(uint8_t* buf, bool intoFrame) const {
  uint8_t* row =
      frameBase + static_cast<ptrdiff_t>(x) * 4 + static_cast<ptrdiff_t>(y) * frameStride;
  for (int32_t r = 0; r < height; ++r, row += frameStride) {
    uint8_t* packed = buf + static_cast<ptrdiff_t>(r) * pitch;
    if (intoFrame)
      std::memcpy(row, packed, static_cast<size_t>(pitch));
    else
      std::memcpy(packed, row, static_cast<size_t>(pitch));
  }
}

void NLECGFrameWrapper::CopyFrom(uint8_t* dst, int dstPitch, NLERect dstRect, const uint8_t* src,
                                 int srcPitch, NLERect srcRect) {
  if (!dst || !src || dstRect.width <= 0 || dstRect.height <= 0) return;
  const size_t rowBytes = static_cast<size_t>(dstRect.width) * 4;
  for (int32_t r = 0; r < dstRect.height; ++r) {
    std::memcpy(dst + static_cast<ptrdiff_t>(dstRect.y + r) * dstPitch + dstRect.x * 4,
                src + static_cast<ptrdiff_t>(srcRect.y + r) * srcPitch + srcRect.x * 4, rowBytes);
  }
}

void NLECGFrameWrapper::FlipImage(uint8_t* dst, int dstW, int dstH, int dstPitch,
                                  const uint8_t* src, int srcW, int srcH, int srcPitch) {
  (void)dstW;
  (void)dstH;
  if (!dst || !src || srcW <= 0 || srcH <= 0) return;
  const size_t rowBytes = static_cast<size_t>(srcW) * 4;
  for (int r = 0; r < srcH; ++r) {
    std::memcpy(dst + static_cast<ptrdiff_t>(r) * dstPitch,
                src + static_cast<ptrdiff_t>(srcH - 1 - r) * srcPitch, rowBytes);
  }
}
