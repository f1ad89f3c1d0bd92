// Frames the host hands to filters, and the compute device it may pass at creation.
//
// Pixel format: 8 bits per channel, four bytes per pixel in the order blue, green, red, alpha
// (BGRA8888). Rows are `stride` bytes apart (stride >= width * 4; padding is allowed and left
// alone by filters). A frame is borrowed by a filter for the duration of one call.
#pragma once

#include <cstdint>

#include "tessarofx/NLEComBase.h"

extern "C++" {
TFX_HOST_API extern const IID IID_INLEFrame;
TFX_HOST_API extern const IID IID_INLEFrameBuffer;
TFX_HOST_API extern const IID IID_INLEFrameSurface;
TFX_HOST_API extern const IID IID_INLECGDevice;
TFX_HOST_API extern const IID IID_INLECGOpenCLOperate;
}

// Where a frame's pixels live.
enum NLEFrameStorage : int32_t {
  kNLEFrameStorageMemory = 0,    // CPU memory, reachable through INLEFrame::GetPixels
  kNLEFrameStorageSurface = 32,  // a device surface, reachable through INLEFrame::GetSurface
};

// Row order of a frame as stored.
enum NLEFrameOrientation : int32_t {
  kNLEFrameTopDown = 0,   // row 0 is the top of the picture
  kNLEFrameBottomUp = 1,  // row 0 is the bottom of the picture
};

struct NLEFrameDesc {
  int32_t width;   // pixels
  int32_t height;  // pixels
  NLEFrameOrientation orientation;
  NLEFrameStorage storage;
};

// The pixel storage object of a frame: tells its row stride.
struct INLEFrameBuffer : IUnknown {
  virtual int32_t GetStride() = 0;  // bytes from one row to the next
  virtual int32_t GetSize() = 0;    // bytes in all

 protected:
  ~INLEFrameBuffer() = default;
};

// A device surface holding a frame's pixels; mapped into CPU memory while it is held.
enum NLESurfaceKind : int32_t {
  kNLESurfaceCPU = 0,     // plain mapped memory, no device object
  kNLESurfaceOpenCL = 2,  // GetDeviceMemory gives an OPENCL::openclMemory*
};

struct INLEFrameSurface : IUnknown {
  virtual NLESurfaceKind GetKind() = 0;
  // CPU address of the surface's first row while mapped, else null.
  virtual uint8_t* GetMappedPixels() = 0;
  // The device memory object behind the surface (an OPENCL::openclMemory*), or null.
  virtual void* GetDeviceMemory() = 0;

 protected:
  ~INLEFrameSurface() = default;
};

struct INLEFrame : IUnknown {
  // Describes the frame. `forWrite` tells that the caller will write the pixels back, `flip` that
  // it will read them bottom-up; a frame may use them to prepare its storage.
  virtual HRESULT GetDescription(NLEFrameDesc* desc, bool forWrite, bool flip) = 0;
  // The pixel storage object (a new reference).
  virtual HRESULT GetBuffer(INLEFrameBuffer** buffer) = 0;
  // CPU memory of a storage-kind 0 frame; NLE_E_NOTIMPL for other kinds.
  virtual HRESULT GetPixels(uint8_t** pixels) = 0;
  // Maps the surface of a storage-kind 32 frame (a new reference); NLE_E_NOTIMPL for others.
  virtual HRESULT GetSurface(INLEFrameSurface** surface) = 0;
  // Hands a surface obtained from GetSurface back: pixels written while it was mapped are
  // committed to the device and the mapping ends.
  virtual HRESULT ReleaseSurface(INLEFrameSurface* surface) = 0;
  // Makes the frame ready to be written as a whole by a filter that reads other frames: a
  // frame whose storage is not yet allocated gets it now (zeroed). Called without arguments.
  virtual HRESULT Prepare() = 0;

 protected:
  ~INLEFrame() = default;
};

// The device's OpenCL operations: the handles a filter needs to build programs and memory.
struct INLECGOpenCLOperate : IUnknown {
  // *programManager receives the device's OPENCL::openclProgramManager*, *memoryHandle the
  // handle memory objects are created with (OPENCL::openclMemManager*).
  virtual HRESULT GetOpenCLHandles(void** programManager, void** memoryHandle) = 0;

 protected:
  ~INLECGOpenCLOperate() = default;
};

// A compute device passed to CreateFilterFromGUID to ask for a filter's OpenCL class. It is
// asked for IID_INLECGOpenCLOperate.
struct INLECGDevice : IUnknown {
  // Human-readable device name into buf (cut to capacity - 1 characters).
  virtual HRESULT GetName(wchar_t* buf, uint32_t capacity) = 0;

 protected:
  ~INLECGDevice() = default;
};
