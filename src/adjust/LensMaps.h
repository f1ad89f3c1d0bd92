// The coordinate maps behind distortFilter and fringingFilter, and the cache that holds them, for
// tests to inspect.
#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include "tessarofx/CxImage.h"

namespace tfx {

// A source coordinate, truncated to 16 bits.
struct LensPoint {
  int16_t x;
  int16_t y;
};

// width * height points per plane, row-major. Distortion uses plane 0 only; fringing uses all
// three: blue, green (and alpha), red.
struct LensMaps {
  float ratio = 0.0f;
  int width = 0;
  int height = 0;
  std::unique_ptr<LensPoint[]> plane[3];
  std::atomic<int> holders{1};  // the cache and the calls using the set
};

// A counted reference to a map set, which lives while the cache or any call holds one. (A
// std::shared_ptr would do, but its control block's type information would leak out of the
// plug-in as exported symbols.)
class LensMapsRef {
 public:
  LensMapsRef() = default;
  explicit LensMapsRef(LensMaps* adopt) : maps_(adopt) {}
  LensMapsRef(const LensMapsRef& other) : maps_(other.maps_) {
    if (maps_) maps_->holders.fetch_add(1, std::memory_order_relaxed);
  }
  LensMapsRef(LensMapsRef&& other) noexcept : maps_(std::exchange(other.maps_, nullptr)) {}
  LensMapsRef& operator=(LensMapsRef other) noexcept {
    std::swap(maps_, other.maps_);
    return *this;
  }
  ~LensMapsRef() {
    if (maps_ && maps_->holders.fetch_sub(1, std::memory_order_acq_rel) == 1) delete maps_;
  }

  const LensMaps* get() const { return maps_; }
  const LensMaps* operator->() const { return maps_; }
  explicit operator bool() const { return maps_ != nullptr; }
  bool operator==(const LensMapsRef& other) const { return maps_ == other.maps_; }
  bool operator!=(const LensMapsRef& other) const { return maps_ != other.maps_; }

 private:
  LensMaps* maps_ = nullptr;
};

// The cached maps for these settings, built (and cached) when missing; empty when the memory is
// not available. The result stays valid while held, whatever other threads do to the cache.
LensMapsRef DistortMaps(float d, int width, int height);
LensMapsRef FringingMaps(float f, int width, int height);

// Maps built since the library was loaded.
uint64_t LensMapBuilds();

// The resampling steps of distortFilter and fringingFilter (which pass a copy of the image),
// reading from `source`, which must be laid out like `target`. Every pixel the step covers is
// written, so `target` need not hold the source's pixels beforehand; row padding is not touched.
// False, with `target` untouched, for a zero strength, a missing buffer, differing layouts or
// maps that cannot be allocated.
bool DistortFrom(const CxImage& source, CxImage* target, float d);
bool FringeFrom(const CxImage& source, CxImage* target, float f);

// Sixteen consecutive output pixels of the one-pass resampling below. The sources a plane reads
// for sixteen neighbours lie on a short stretch of up to four rows, so each is coded in a byte
// against the plane's base offset: the top two bits count rows (rowBytes apart), the low six the
// bytes from there, at most 60 so that the word fits in the row's 64-byte window. Blocks that do
// not fit, or hold the frame's last pixels, keep their offsets in LensComposite::spill instead.
struct alignas(64) LensBlock {
  uint8_t index[3][16];  // blue, green (and alpha), red
  int32_t base[3];       // windows of 64 bytes start at base + row * rowBytes, inside the frame
  int32_t spill;         // -1, or where the block's 48 offsets start in units of 48
};

// Distortion followed by fringing on packed BGRA frames, in one pass: for each output pixel, the
// byte offsets into the source that its blue, its green and alpha, and its red come from after
// both steps. Built for one setting and size (about four bytes a pixel), so kept by the caller
// that runs the setting frame after frame.
struct LensComposite {
  float distortion = 0.0f;
  float fringing = 0.0f;
  int width = 0;
  int height = 0;
  struct Free {
    void operator()(LensBlock* memory) const;
  };
  std::unique_ptr<LensBlock[], Free> blocks;  // one per sixteen pixels, rounded up
  std::vector<int32_t> spill;  // per spilled block: blue, green, red offsets, 16 each
};

// Builds `out` for both (non-zero) strengths and a packed BGRA frame of this size; false, with
// `out` emptied, for a frame the single pass does not cover (a side over 8191 pixels, more than
// INT32_MAX bytes) or memory that cannot be had.
bool ComposeLens(float d, float f, int width, int height, LensComposite* out);

// What DistortFrom into a frame laid out like `target` and FringeFrom out of it into `target`
// give, reading `source` once. False, with `target` untouched, unless both are packed BGRA
// frames of the composite's size.
bool DistortFringeFrom(const CxImage& source, CxImage* target, const LensComposite& composite);

}  // namespace tfx
