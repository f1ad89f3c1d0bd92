// libFuzzer target for the exported image functions: CxImages and plain buffers of any geometry
// (empty, one pixel, padded, strides shorter than a row, headers whose byte count wraps 32 bits,
// every bits-per-pixel and format value) and arguments of any value (NaN, infinities, huge and
// negative sizes, radii and coordinates) through every function a host can call.
//
// Every buffer is exactly as large as its description says and no larger, so the sanitizers
// catch a single byte read or written outside it. A description that needs more memory than a
// fuzz run should allocate is handed a tiny buffer instead when its size overflows (the function
// must refuse it), and is skipped otherwise.
#include <fuzzer/FuzzedDataProvider.h>

#include <climits>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <limits>
#include <memory>
#include <vector>

#include "tessarofx/AlignedMemory.h"
#include "tessarofx/Blur.h"
#include "tessarofx/ColorAdjust.h"
#include "tessarofx/Compositing.h"
#include "tessarofx/CubeLut.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/Denoise.h"
#include "tessarofx/DetailFilters.h"
#include "tessarofx/HSLAdjust.h"
#include "tessarofx/HueAdjust.h"
#include "tessarofx/LensAdjust.h"
#include "tessarofx/LightAdjust.h"
#include "tessarofx/Lut3dAdjust.h"
#include "tessarofx/Vignette.h"
#include "tessarofx/WhiteBalance.h"
#include "tessarofx/WhiteBalanceEstimate.h"

namespace {

constexpr uint64_t kCap = 1 << 16;  // bytes a buffer of the run may have

// Buffers that live for one input.
struct Arena {
  std::vector<std::unique_ptr<uint8_t[]>> blocks;

  // `bytes` bytes of a pattern, or a 16-byte block for a size that cannot be, or null when the
  // size is real but too large for a fuzz run.
  uint8_t* Buffer(uint64_t bytes, uint8_t salt, bool overflowed) {
    if (!overflowed && bytes > kCap) return nullptr;
    const uint64_t n = overflowed ? 16 : bytes;
    blocks.emplace_back(new uint8_t[n ? n : 1]);
    uint8_t* p = blocks.back().get();
    for (uint64_t i = 0; i < n; ++i) p[i] = static_cast<uint8_t>(salt + i * 31 + (i >> 5));
    return p;
  }
};

int Dim(FuzzedDataProvider& in) {
  switch (in.ConsumeIntegralInRange<int>(0, 9)) {
    case 0:
      return -in.ConsumeIntegralInRange<int>(1, 3);
    case 1: {
      const int large[] = {32767, 32768, 46341, 65536, 1 << 20, INT_MAX, INT_MIN};
      return in.PickValueInArray(large);
    }
    case 2:
      return in.ConsumeIntegral<int>();
    default:
      return in.ConsumeIntegralInRange<int>(0, 40);
  }
}

// A row length as a host would compute it, saturated instead of overflowing.
int Times(int a, int b) {
  const int64_t v = int64_t{a} * b;
  return v > INT_MAX ? INT_MAX : (v < INT_MIN ? INT_MIN : static_cast<int>(v));
}

float Real(FuzzedDataProvider& in) {
  switch (in.ConsumeIntegralInRange<int>(0, 9)) {
    case 0:
      return std::numeric_limits<float>::quiet_NaN();
    case 1:
      return in.ConsumeBool() ? HUGE_VALF : -HUGE_VALF;
    case 2:
      return in.ConsumeBool() ? 3e38f : -3e38f;
    case 3:
      return static_cast<float>(in.ConsumeIntegral<int32_t>());
    case 4:
      return 0.0f;
    default:
      return in.ConsumeFloatingPointInRange<float>(-300.0f, 300.0f);
  }
}

// Bytes for `count` items of `size` bytes, and whether that product overflows 31 bits.
uint64_t Bytes(int64_t count, int64_t size, bool* overflowed) {
  if (count < 0 || size < 0) {
    *overflowed = false;
    return 0;
  }
  const long double bytes = static_cast<long double>(count) * static_cast<long double>(size);
  *overflowed = bytes > INT_MAX;
  return *overflowed ? 0 : static_cast<uint64_t>(bytes);
}

// A plane or image buffer of width x height items of `size` bytes.
uint8_t* Plane(Arena& arena, FuzzedDataProvider& in, int width, int height, int size) {
  bool overflowed = false;
  const uint64_t rows = Bytes(width, size, &overflowed);
  const uint64_t bytes = overflowed ? 0 : Bytes(int64_t(rows), height, &overflowed);
  return arena.Buffer(bytes, in.ConsumeIntegral<uint8_t>(), overflowed);
}

// The image the function runs on: null, empty, owning, or a header over a buffer of exactly
// GetSize() bytes whose stride, size and format say anything at all.
struct ImageHolder {
  std::unique_ptr<CxImage> image;
  uint8_t* bits = nullptr;
};

void MakeImage(FuzzedDataProvider& in, Arena& arena, ImageHolder* holder) {
  const unsigned bppChoices[] = {32, 32, 24, 8, 16, 0, 12, 64};
  const unsigned bpp = in.PickValueInArray(bppChoices);
  const auto format = static_cast<_ImagePixelFormat>(in.ConsumeIntegralInRange<int>(0, 6));
  const unsigned width = static_cast<unsigned>(Dim(in));
  const unsigned height = static_cast<unsigned>(Dim(in));
  switch (in.ConsumeIntegralInRange<int>(0, 7)) {
    case 0:
      return;  // null
    case 1:
      holder->image.reset(new CxImage());
      return;
    case 2: {
      // Create allocates what the header says; only sizes that cannot be, or small ones, are
      // asked for.
      const uint64_t row = ((uint64_t{bpp} * width + 31) >> 3) & ~uint64_t{3};
      const long double bytes = static_cast<long double>(row) * height;
      if (bytes > kCap && bytes <= UINT32_MAX) return;
      holder->image.reset(new CxImage());
      holder->image->Create(width, height, bpp, format);
      if (holder->image->GetBits()) {
        uint8_t* bits = holder->image->GetBits();
        for (uint32_t i = 0; i < holder->image->GetSize(); ++i) bits[i] = static_cast<uint8_t>(i);
      }
      return;
    }
    default: {
      const uint32_t row = static_cast<uint32_t>((uint64_t{bpp} * width + 7) / 8);
      uint32_t stride = row;
      switch (in.ConsumeIntegralInRange<int>(0, 3)) {
        case 0:
          stride = row + in.ConsumeIntegralInRange<uint32_t>(1, 9);
          break;
        case 1:
          stride = row - in.ConsumeIntegralInRange<uint32_t>(1, 9);
          break;
        case 2:
          stride = in.ConsumeIntegral<uint32_t>();
          break;
        default:
          break;
      }
      // The size the header records wraps like the header's own arithmetic.
      const uint32_t size = height * stride;
      holder->bits = arena.Buffer(size, in.ConsumeIntegral<uint8_t>(), false);
      if (!holder->bits) return;
      holder->image.reset(new CxImage(&holder->bits, width, height, bpp, stride, format));
      return;
    }
  }
}

tagRGBQUAD Quad(FuzzedDataProvider& in) {
  const uint32_t v = in.ConsumeIntegral<uint32_t>();
  return tagRGBQUAD{uint8_t(v), uint8_t(v >> 8), uint8_t(v >> 16), uint8_t(v >> 24)};
}

void OnImage(FuzzedDataProvider& in, CxImage* image) {
  switch (in.ConsumeIntegralInRange<int>(0, 31)) {
    case 0:
      exposureAdjustment(image, Real(in));
      break;
    case 1:
      brightnessAdjustment(image, Real(in));
      break;
    case 2:
      contrastAdjustment(image, Real(in));
      break;
    case 3:
      vibranceAdjustment(image, Real(in));
      break;
    case 4:
      saturationAdjustment(image, Real(in));
      break;
    case 5:
      hdrHighlight(image, Real(in));
      break;
    case 6:
      hdrShadow(image, Real(in));
      break;
    case 7:
      hdrWhiteLevel(image, Real(in));
      break;
    case 8:
      hdrBlackLevel(image, Real(in));
      break;
    case 9:
      whiteBalanceAdjustment(image, Real(in));
      break;
    case 10:
      temperatureAdjustment(image, static_cast<long>(in.ConsumeIntegral<int64_t>()));
      break;
    case 11:
      tintAdjustment(image, Real(in));
      break;
    case 12:
      vignetteAdjustFilter(image, Real(in), Real(in), Real(in), Real(in), Real(in), Real(in));
      break;
    case 13:
      distortFilter(image, Real(in));
      break;
    case 14:
      fringingFilter(image, Real(in));
      break;
    case 15: {
      HSLBands bands{};
      for (HSLBandValues& b : bands.band) {
        if (in.ConsumeBool()) b = HSLBandValues{Real(in), Real(in), Real(in), Real(in), Real(in)};
      }
      hslAdjustment(image, bands);
      break;
    }
    case 16:
      hueAdjustment(image, Real(in));
      break;
    case 17:
      deNoiseRGB(image, Real(in));
      break;
    case 18:
      deNoiseLumiance(image, Real(in));
      break;
    case 19:
      dehaze(image, Real(in));
      break;
    case 20: {
      uint32_t maxRGB = 0, maxDark = 0;
      delete[] getMinDarkChannel(image, in.ConsumeBool() ? &maxRGB : nullptr,
                                 in.ConsumeBool() ? &maxDark : nullptr);
      break;
    }
    case 21:
      sharpen(image, Real(in));
      break;
    case 22:
      clarity(image, Real(in));
      break;
    case 23:
      diffuse(image, Real(in));
      break;
    case 24:
      addNoiseFilter(image, Real(in), Real(in));
      break;
    case 25:
      if (image) {
        image->GetPixelColor(static_cast<unsigned long>(in.ConsumeIntegral<uint64_t>()),
                             static_cast<unsigned long>(in.ConsumeIntegral<uint64_t>()),
                             in.ConsumeBool());
        image->SetPixelColor(static_cast<unsigned long>(in.ConsumeIntegralInRange(0, 64)),
                             static_cast<unsigned long>(in.ConsumeIntegralInRange(0, 64)),
                             Quad(in));
      }
      break;
    case 26:
      if (image) {
        CxImage r, g, b, a;
        const bool hsl = in.ConsumeBool();
        // Combine aborts on planes of unequal sizes or depths, by design: an empty image splits
        // into empty planes, which it must not be given.
        if ((hsl ? image->SplitHSLA(&r, &g, &b, &a) : image->SplitRGBA(&r, &g, &b, &a)) &&
            r.GetBpp() == 8) {
          image->Combine(&r, &g, &b, in.ConsumeBool() ? &a : nullptr, hsl ? 1 : 0);
        }
      }
      break;
    case 27:
      if (image) {
        CxImage copy;
        copy.Copy(image);
        copy.Copy(*image);
      }
      break;
    default:
      break;
  }
}

// Functions on raw buffers whose sizes come in as arguments.
void OnBuffers(FuzzedDataProvider& in, Arena& arena) {
  const int width = Dim(in), height = Dim(in);
  switch (in.ConsumeIntegralInRange<int>(0, 22)) {
    case 0: {
      const int channels = in.ConsumeIntegralInRange<int>(-1, 5);
      // Rows padded to 4 bytes.
      bool overflowed = false;
      const uint64_t row = (Bytes(width, channels, &overflowed) + 3) & ~uint64_t{3};
      const uint64_t bytes = overflowed ? 0 : Bytes(int64_t(row), height, &overflowed);
      uint8_t* p = arena.Buffer(bytes, 7, overflowed);
      if (p) {
        stackblur(p, static_cast<unsigned>(width), static_cast<unsigned>(height), channels,
                  static_cast<unsigned>(Dim(in)), in.ConsumeIntegralInRange<int>(0, 3));
      }
      break;
    }
    case 1:
    case 2: {
      // gaussianBlur's rows are padded to 4 bytes, fastAverageBlur's are not.
      const bool gaussian = in.ConsumeBool();
      const int channels = in.ConsumeIntegralInRange<int>(-1, 5);
      bool overflowed = false;
      uint64_t row = Bytes(width, channels, &overflowed);
      if (gaussian) row = (row + 3) & ~uint64_t{3};
      const uint64_t bytes = overflowed ? 0 : Bytes(int64_t(row), height, &overflowed);
      uint8_t* p = arena.Buffer(bytes, 9, overflowed);
      if (p) {
        const int radius = Dim(in);
        if (gaussian) {
          gaussianBlur(p, width, height, channels, radius);
        } else {
          fastAverageBlur(p, width, height, channels, radius);
        }
      }
      break;
    }
    case 3:
    case 4:
    case 5: {
      uint8_t* src = Plane(arena, in, width, height, 1);
      uint8_t* dst = Plane(arena, in, width, height, 1);
      if (!src || !dst) break;
      const int radius = Dim(in);
      const int which = in.ConsumeIntegralInRange<int>(0, 2);
      if (which == 0) fastWindowAverageFilter(src, dst, width, height, radius);
      if (which == 1) fastWindowVarianceFilter(src, dst, width, height, radius);
      if (which == 2) fastFilter(src, dst, width, height, radius, Real(in));
      break;
    }
    case 6: {
      const int bins = in.ConsumeIntegralInRange<int>(-2, 300);
      uint8_t* histogram = Plane(arena, in, bins, 1, 1);
      if (histogram) calFilterValue(histogram, bins, in.ConsumeIntegral<int>());
      break;
    }
    case 7: {
      const int stride = in.ConsumeBool() ? width : Dim(in);
      uint8_t* src = Plane(arena, in, stride, height, 1);
      uint8_t* dst = Plane(arena, in, stride, height, 1);
      if (src && dst) dct_Denosing(src, dst, width, height, stride, Real(in));
      break;
    }
    case 8: {
      uint8_t* plane = Plane(arena, in, width, height, 1);
      if (plane) channelDenoise(plane, width, height, Dim(in), Real(in));
      break;
    }
    case 9: {
      uint8_t* dark = Plane(arena, in, width, height, 1);
      uint8_t* mean = Plane(arena, in, width, height, 1);
      if (dark && mean) delete[] calL(dark, mean, width, height, Real(in));
      break;
    }
    case 10: {
      uint8_t* pixels = Plane(arena, in, width, height, 4);
      if (pixels) channelMean(pixels, width, height, in.ConsumeIntegralInRange<int>(-1, 5));
      break;
    }
    case 11: {
      uint8_t* src = Plane(arena, in, width, height, 4);
      uint8_t* dst = Plane(arena, in, width, height, 4);
      if (src && dst) doAutoWhiteBalance(src, dst, width, height);
      break;
    }
    case 12: {
      uint8_t* src = Plane(arena, in, width, height, 4);
      uint8_t* corrected = in.ConsumeBool() ? Plane(arena, in, width, height, 4) : nullptr;
      if (!src) break;
      getAutoWhiteBalanceCCTChangeRate(src, corrected, width, height);
      getAutoWhiteBalanceTintChangeRate(src, corrected, width, height);
      break;
    }
    case 13: {
      const int bpp = in.ConsumeIntegralInRange<int>(-1, 5);
      bool overflowed = false;
      Bytes(Bytes(width, height, &overflowed), bpp, &overflowed);
      const long double bytes = static_cast<long double>(width) * height * bpp;
      if (!overflowed && bytes > kCap) break;  // a real allocation, too large for a fuzz run
      unsigned char* buffer = nullptr;
      reMallocImage(in.ConsumeBool() ? &buffer : nullptr, width, height, bpp);
      delete[] buffer;
      break;
    }
    case 14:
    case 15:
    case 16: {
      // makeImageFrame takes a stride; scaleImage and blurImage read packed rows.
      const int which = in.ConsumeIntegralInRange<int>(0, 2);
      const int bpp = in.PickValueInArray({32, 24, 8, 0, -32, 64});
      const int stride = which == 0 && in.ConsumeBool() ? Dim(in) : Times(width, 4);
      uint8_t* src = Plane(arena, in, stride, height, 1);
      if (!src) break;
      const int border = in.ConsumeBool() ? in.ConsumeIntegralInRange<int>(-2, 24) : Dim(in);
      // The outputs grow by twice the border on each axis: keep them small.
      const long double outBytes = (static_cast<long double>(width) + 2.0L * border) *
                                   (static_cast<long double>(height) + 2.0L * border) * 4;
      if (outBytes > kCap && outBytes <= INT_MAX) break;
      const PIPNLERGB colour{in.ConsumeIntegral<int>(), in.ConsumeIntegral<int>(),
                             in.ConsumeIntegral<int>(), in.ConsumeIntegral<int>()};
      unsigned char* out = nullptr;
      int outWidth = 0, outHeight = 0;
      if (which == 0) {
        makeImageFrame(&out, &outWidth, &outHeight, src, width, height, stride, bpp, colour,
                       border);
      } else if (which == 1) {
        scaleImage(&out, &outWidth, &outHeight, src, width, height, bpp, colour, border);
      } else {
        blurImage(&out, &outWidth, &outHeight, src, width, height, bpp, border);
      }
      delete[] out;
      break;
    }
    case 17: {
      const int dstWidth = Dim(in), dstHeight = Dim(in);
      const int srcStride = in.ConsumeBool() ? Times(width, 4) : Dim(in);
      uint8_t* src = Plane(arena, in, srcStride, height, 1);
      uint8_t* dst = Plane(arena, in, dstWidth, dstHeight, 4);
      if (!src || !dst) break;
      mergeImage(dst, src, dstWidth, dstHeight, width, height, srcStride, Dim(in), Dim(in), Dim(in),
                 Dim(in), Dim(in), Dim(in), Dim(in), Dim(in));
      break;
    }
    case 18: {
      const int dstWidth = Dim(in), dstHeight = Dim(in);
      const int srcStride = in.ConsumeBool() ? Times(width, 4) : Dim(in);
      const int dstStride = in.ConsumeBool() ? Times(dstWidth, 4) : Dim(in);
      uint8_t* src = Plane(arena, in, srcStride, height, 1);
      uint8_t* dst = Plane(arena, in, dstStride, dstHeight, 1);
      if (src && dst) {
        clipOutBorder(src, dst, width, height, srcStride, dstWidth, dstHeight, dstStride);
      }
      break;
    }
    case 19: {
      bool overflowed = false;
      const uint64_t bytes = Bytes(Bytes(width, height, &overflowed), 4, &overflowed);
      uint8_t* mask = arena.Buffer(overflowed ? 0 : bytes, 0, overflowed);
      if (mask) {
        generateGradient(width, height, Real(in), Real(in), Real(in),
                         reinterpret_cast<float*>(mask));
      }
      break;
    }
    case 20: {
      const int stride = in.ConsumeBool() ? Times(width, 4) : Dim(in);
      uint8_t* pixels = Plane(arena, in, stride, height, 1);
      if (!pixels) break;
      AutoWhiteBalance balance;
      balance.SetWhitePointPos(pixels, width, height, stride, Dim(in), Dim(in), Dim(in));
      if (balance.BGR2YCbCr(pixels, width, height, stride)) {
        balance.AutoCalcGain(pixels, width, height, stride);
      }
      uint8_t* out = Plane(arena, in, stride, height, 1);
      if (out) balance.Process(pixels, out, width, height, stride, stride);
      break;
    }
    case 21: {
      const uint32_t size = in.ConsumeIntegralInRange<uint32_t>(0, 1 << 12);
      FreeMemory(AllocMemory(size, in.ConsumeBool()));
      const size_t alignments[] = {0, 1, 3, 16, 64, 4096, SIZE_MAX};
      aligned_free(aligned_malloc(in.ConsumeIntegralInRange<size_t>(0, 1 << 12),
                                  in.PickValueInArray(alignments)));
      break;
    }
    default: {
      int histogram[768] = {};
      for (int i = 0; i < 768; i += 17) histogram[i] = in.ConsumeIntegral<int>();
      calThreshold(histogram, width, height, Real(in));
      // It allocates the image it returns: only sizes a run can afford, or ones that overflow.
      // 24-bit rows padded to 4 bytes, as Create makes them.
      const long double bytes =
          static_cast<long double>((int64_t{width} * 24 + 31) / 32 * 4) * height;
      if (width < 1 || height < 1 || bytes <= kCap || bytes > UINT32_MAX) {
        delete createTemperateColor(width, height);
      }
      break;
    }
  }
}

// Per-pixel and per-value forms with extreme arguments.
void OnValues(FuzzedDataProvider& in) {
  const tagRGBQUAD c = Quad(in);
  calContrastColor(c, in.ConsumeIntegral<int>(), in.ConsumeIntegral<int>(),
                   in.ConsumeIntegral<int>());
  calPowColor(c, Real(in));
  mixLumaAndColor(c, in.ConsumeIntegral<uint8_t>(), in.ConsumeIntegral<uint8_t>(), Real(in));
  calNewColor(c, Real(in));
  enHanceColor(Real(in), Real(in));
  whiteToneColor(Real(in), Real(in));
  calHighlight(c, Real(in));
  calShadow(c, Real(in));
  calWhiteLevelPixel(c, Real(in));
  calBlackLevelPixel(c, Real(in));
  temperatureToRGB(static_cast<long>(in.ConsumeIntegral<int64_t>()));
  mixColorAndTmpColor(c, Quad(in), Real(in));
  calNewTintPixel(c, in.ConsumeIntegral<int>(), in.ConsumeIntegral<int>(),
                  in.ConsumeIntegral<int>());
  vignettePixel(c, Real(in), Real(in), Real(in), Real(in));
  transformHue1(c, Real(in));
  transformHue2(_rgb{Real(in), Real(in), Real(in)}, Real(in));
  xy_to_CCT_Hernandez1999(Real(in), Real(in));
  rgb2temperature(in.ConsumeIntegral<int>(), in.ConsumeIntegral<int>(), in.ConsumeIntegral<int>());
  CxImage::HSLtoRGB(c);
  CxImage::RGBtoHSL(c);
  CxImage::HueToRGB(Real(in), Real(in), Real(in));
}

// The lattice and its application, with the pixel arguments doLUT trusts least.
void OnLattice(FuzzedDataProvider& in, Arena& arena) {
  static CubeLut* const lut = new CubeLut();
  lut->generateLUT3DData(in.ConsumeIntegralInRange<int>(-1, 66));
  switch (in.ConsumeIntegralInRange<int>(0, 3)) {
    case 0: {
      const int width = Dim(in), height = Dim(in);
      const int bytesPerPixel = in.ConsumeIntegralInRange<int>(-1, 5);
      const int pitch = in.ConsumeBool() ? Times(width, bytesPerPixel) : Dim(in);
      // Every row but the last is a pitch long; the last holds its pixels.
      const int64_t span = pitch < 0 ? -int64_t{pitch} : pitch;
      const bool none = width < 1 || height < 1 || bytesPerPixel < 1;
      const long double need = none ? 0.0L
                                    : static_cast<long double>(height - 1) * span +
                                          static_cast<long double>(width) * bytesPerPixel;
      const bool overflowed = need > INT_MAX;
      uint8_t* pixels = arena.Buffer(overflowed ? 0 : static_cast<uint64_t>(need), 3, overflowed);
      if (!pixels) break;
      // A bottom-up image starts at its last row.
      uint8_t* start =
          pitch < 0 && height > 1 && !overflowed ? pixels + (height - 1) * span : pixels;
      lut->doLUT(in.ConsumeBool() ? start : nullptr, width, height, pitch, bytesPerPixel);
      break;
    }
    case 1: {
      const CubeLut::PR p{Real(in), Real(in), Real(in)};
      lut->updateCalcuatedData(Dim(in), Dim(in), Dim(in), p);
      lut->updateLUT3DData();
      lut->reset();
      break;
    }
    case 2: {
      using Adjust = CubeLut* (*)(CubeLut*, float);
      const Adjust adjustments[] = {
          lut3d_exposureAdjustment, lut3d_brightnessAdjustment, lut3d_contrastAdjustment,
          lut3d_vibranceAdjustment, lut3d_saturationAdjustment, lut3d_hdrHighlight,
          lut3d_hdrShadow,          lut3d_hdrWhiteLevel,        lut3d_hdrBlackLevel,
          lut3d_tintAdjustment};
      in.PickValueInArray(adjustments)(in.ConsumeBool() ? lut : nullptr, Real(in));
      lut3d_adjustWhiteBalance(lut, Real(in), Real(in));
      lut3d_temperatureAdjustment(lut, static_cast<long>(in.ConsumeIntegral<int64_t>()));
      break;
    }
    default: {
      std::unique_ptr<CubeLut> copy(lut->clone());
      int w = 0, h = 0, d = 0, channels = 0, bytes = 0;
      copy->getLut3DData(&w, &h, &d, &channels);
      copy->getAtlasData(&bytes);
      break;
    }
  }
}

}  // namespace

// Lattice copies are 3 MiB each; the default quarantine of freed blocks would hold gigabytes of
// them before reusing any.
extern "C" const char* __asan_default_options() { return "quarantine_size_mb=64"; }

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  FuzzedDataProvider in(data, size);
  Arena arena;
  switch (in.ConsumeIntegralInRange<int>(0, 3)) {
    case 0: {
      ImageHolder holder;
      MakeImage(in, arena, &holder);
      OnImage(in, holder.image.get());
      break;
    }
    case 1:
      OnBuffers(in, arena);
      break;
    case 2:
      OnValues(in);
      break;
    default:
      OnLattice(in, arena);
      break;
  }
  return 0;
}
