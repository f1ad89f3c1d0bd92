// A frame whose storage, stride and surface behaviour a test controls, and which counts the
// calls the plug-in makes on it.
#pragma once

#include <cstdint>
#include <utility>
#include <vector>

#include "tessarofx/NLEFrame.h"

class TestFrame final : public scombase::CUnknown, public INLEFrame {
 public:
  // A frame of width x height pixels, rows `stride` bytes apart (0: packed), filled with `fill`.
  // With `surface` true the pixels are reached through a mapped surface (storage kind 32).
  TestFrame(int width, int height, int stride = 0, bool surface = false, uint8_t fill = 0);
  // A packed frame holding `bytes`.
  TestFrame(int w, int h, std::vector<uint8_t> bytes) : TestFrame(w, h) {
    pixels = std::move(bytes);
  }

  NLE_DECLARE_IUNKNOWN
  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override;

  HRESULT GetDescription(NLEFrameDesc* desc, bool forWrite, bool flip) override;
  HRESULT GetBuffer(INLEFrameBuffer** buffer) override;
  HRESULT GetPixels(uint8_t** pixels) override;
  HRESULT GetSurface(INLEFrameSurface** surface) override;
  HRESULT ReleaseSurface(INLEFrameSurface* surface) override;
  HRESULT Prepare() override;

  uint8_t* Row(int y) {
    return pixels.data() + static_cast<size_t>(y) * static_cast<size_t>(stride);
  }
  uint8_t* Pixel(int x, int y) { return Row(y) + x * 4; }

  int width;
  int height;
  int stride;
  bool useSurface;
  std::vector<uint8_t> pixels;
  int prepareCalls = 0;
  int surfaceReleases = 0;
  void* deviceMemory = nullptr;  // what the surface reports as its device memory
  NLESurfaceKind surfaceKind = kNLESurfaceCPU;
};
