// A packed 8-bit BGRA view of a host frame for the lifetime of one Running call: cropped,
// optionally flipped, copied into a private buffer only when the frame's own rows cannot be used
// as they are, and written back on destruction when asked to.
#pragma once

#include <cstdint>

#include "tessarofx/NLECGFilter.h"
#include "tessarofx/NLEFrame.h"

class NLECGFrameWrapper {
 public:
  NLECGFrameWrapper(INLEFrame* frame, bool writeBack, bool flip, NLERectF roi);
  virtual ~NLECGFrameWrapper();
  NLECGFrameWrapper(const NLECGFrameWrapper&) = delete;
  NLECGFrameWrapper& operator=(const NLECGFrameWrapper&) = delete;

  // True when the view has NO pixels. The inverted sense is relied on by callers and kept.
  bool IsValid() const { return data == nullptr; }
  int GetWidth() const { return width; }
  int GetHeight() const { return height; }
  int GetPitch() const { return pitch; }
  uint8_t* GetData() const { return data; }

  // Copies dstRect.height rows of dstRect.width * 4 bytes between rectangles of two buffers.
  static void CopyFrom(uint8_t* dst, int dstPitch, NLERect dstRect, const uint8_t* src,
                       int srcPitch, NLERect srcRect);
  // Copies the rows of src into dst in reverse order (dst row r = src row h - 1 - r).
  static void FlipImage(uint8_t* dst, int dstW, int dstH, int dstPitch, const uint8_t* src,
                        int srcW, int srcH, int srcPitch);

 private:
  void CopyRegion(uint8_t* to, bool intoFrame) const;

  INLEFrame* frame = nullptr;
  uint8_t* data = nullptr;
  uint8_t* frameBase = nullptr;
  INLEFrameSurface* surface = nullptr;
  int32_t x = 0;
  int32_t y = 0;
  int32_t width = 0;
  int32_t height = 0;
  int32_t frameStride = 0;
  int32_t pitch = 0;
  bool copied = false;
  bool writeBack = false;
  bool flip = false;
};
