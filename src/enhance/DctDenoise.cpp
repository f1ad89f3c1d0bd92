// The sliding 8 x 8 DCT denoiser and its colour forms. The transforms themselves live in
// simd/dct8_hwy.cpp; this file checks arguments, keeps the unfiltered border and filters the
// colour planes of images where they lie, or splits images into planes.
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>

#include "base/ByteLimits.h"
#include "simd/dct8.h"
#include "simd/hsl_rows.h"
#include "tessarofx/Denoise.h"

void DCT8X81D(const float* in, float* out, bool inverse) {
  if (!in || !out) return;
  tfx::Dct8(in, out, inverse);
}

void DCT8X82D(const float* in, float* out, bool inverse) {
  if (!in || !out) return;
  tfx::Dct8x8(in, out, inverse);
}

void DCT8X82DR(const float* rows, float* out) {
  if (!rows || !out) return;
  tfx::Dct8x8Columns(rows, out);
}

void dct_Denosing(const unsigned char* src, unsigned char* dst, int width, int height, int stride,
                  float sigma) {
  if (!src || !dst || width < 1 || height < 1 || stride < width) return;
  if (!tfx::FitsInt(stride, height, 1)) return;
  // 3 * sigma rounds to the same float whether formed in float or in double.
  const float threshold = 3.0f * sigma;
  const bool blocks = width > 8 && height > 8;
  if (blocks && !tfx::DctDenoisePlane(src, dst, width, height, stride, threshold)) return;
  if (dst == src) return;
  // The last 8 rows and columns keep their source pixels although blocks covered some of them.
  const int blockRows = blocks ? height - 8 : 0;
  const int blockColumns = blocks ? width - 8 : 0;
  for (int y = 0; y < height; ++y) {
    const ptrdiff_t row = static_cast<ptrdiff_t>(y) * stride;
    const int from = y < blockRows ? blockColumns : 0;
    std::memcpy(dst + row + from, src + row + from, static_cast<size_t>(width - from));
  }
}

namespace {

// An image whose header describes its buffer: 24 or 32 bits, rows no shorter than the pixels
// they hold, and 8-bit planes of its size whose row lengths fit the header's 32-bit fields.
bool Denoisable(const CxImage* image) {
  if (!image || !image->GetBits()) return false;
  const uint64_t width = image->GetWidth(), height = image->GetHeight();
  const uint32_t bpp = image->GetBpp();
  if (width == 0 || height == 0 || (bpp != 24 && bpp != 32)) return false;
  if (width > (UINT32_MAX - 31) / 32) return false;
  if (image->GetEffWidth() < width * (bpp / 8) ||
      uint64_t{image->GetEffWidth()} * height != image->GetSize()) {
    return false;
  }
  // Recombining re-creates the image with rows padded to 4 bytes; a wrapped buffer too small for
  // those (24-bit rows of width * 3 bytes) is refused here, before anything changes.
  const uint64_t padded = ((uint64_t{bpp} * width + 31) >> 3) & ~uint64_t{3};
  return padded * height <= image->GetSize();
}

// Pixels of 3 or 4 bytes in the order the header names, in rows as Create pads them: splitting
// such an image into planes and recombining them changes nothing but the planes' bytes.
bool Interleaved(const CxImage* image) {
  const uint32_t bpp = image->GetBpp();
  const _ImagePixelFormat format = image->getFormat();
  const bool order =
      bpp == 32 ? format == IPF_BGRA || format == IPF_RGBA : format == IPF_BGR || format == IPF_RGB;
  const uint64_t padded = ((uint64_t{bpp} * image->GetWidth() + 31) >> 3) & ~uint64_t{3};
  return order && image->GetEffWidth() == padded;
}

// What splitting, denoising and recombining the planes gives such an image, without the
// planes: the colour bytes are filtered where they lie, or turned into hue, saturation and
// lightness triples, filtered there and turned back. Alpha and row padding are not touched.
// False when memory runs out, with the image untouched.
bool DenoiseInterleaved(CxImage* image, float sigma, bool hsl) {
  const int width = static_cast<int>(image->GetWidth());
  const int height = static_cast<int>(image->GetHeight());
  const size_t bytesPerPixel = image->GetBpp() / 8;
  const ptrdiff_t stride = image->GetEffWidth();
  // As dct_Denosing forms it.
  const float threshold = 3.0f * sigma;
  const bool blocks = width > 8 && height > 8;
  uint8_t* bits = image->GetBits();
  if (!hsl) {
    return !blocks ||
           tfx::DctDenoisePlane(bits, bits, width, height, stride, threshold, bytesPerPixel, 3);
  }
  const bool redFirst = image->getFormat() == IPF_RGBA || image->getFormat() == IPF_RGB;
  // Three planes of their own, one byte a sample: each row converts with whole-vector loads and
  // stores, and the denoiser reads and writes them as bytes in a row.
  const size_t planeBytes = static_cast<size_t>(width) * height;
  const std::unique_ptr<uint8_t[]> samples(new (std::nothrow) uint8_t[3 * planeBytes]);
  if (!samples) return false;
  uint8_t* const planes[3] = {samples.get(), samples.get() + planeBytes,
                              samples.get() + 2 * planeBytes};
  const auto at = [&](int plane, int y) { return planes[plane] + static_cast<size_t>(y) * width; };
  for (int y = 0; y < height; ++y) {
    tfx::RgbToHslRow(bits + y * stride, bytesPerPixel, redFirst, at(0, y), at(1, y), at(2, y),
                     width);
  }
  for (uint8_t* plane : planes) {
    if (blocks && !tfx::DctDenoisePlane(plane, plane, width, height, width, threshold)) {
      return false;
    }
  }
  for (int y = 0; y < height; ++y) {
    tfx::HslToRgbRow(at(0, y), at(1, y), at(2, y), bits + y * stride, bytesPerPixel, redFirst,
                     width);
  }
  return true;
}

// Denoises the colour (or HSL) planes of `image`: where they lie when its layout allows, else
// split into three planes (and alpha) that are then recombined.
CxImage* DenoisePlanes(CxImage* image, float strength, bool hsl) {
  if (!Denoisable(image) || strength == 0.0f) return image;
  // The product is formed in double, as the strength scale is a double constant.
  const float sigma = static_cast<float>(strength * 0.15);
  if (Interleaved(image)) {
    DenoiseInterleaved(image, sigma, hsl);
    return image;
  }
  const unsigned width = image->GetWidth(), height = image->GetHeight();
  CxImage planes[4];
  for (CxImage& plane : planes) {
    if (!plane.Create(width, height, 8, IPF_RGB)) return image;
  }
  const bool split = hsl ? image->SplitHSLA(&planes[0], &planes[1], &planes[2], &planes[3])
                         : image->SplitRGBA(&planes[0], &planes[1], &planes[2], &planes[3]);
  if (!split) return image;
  const int stride = static_cast<int>(planes[0].GetEffWidth());
  for (int i = 0; i < 3; ++i) {
    uint8_t* bits = planes[i].GetBits();
    dct_Denosing(bits, bits, static_cast<int>(width), static_cast<int>(height), stride, sigma);
  }
  image->Combine(&planes[0], &planes[1], &planes[2], &planes[3], hsl ? 1 : 0);
  return image;
}

}  // namespace

CxImage* deNoiseRGB(CxImage* image, float strength) {
  return DenoisePlanes(image, strength, false);
}

// Hue and saturation are filtered like lightness.
CxImage* deNoiseLumiance(CxImage* image, float strength) {
  return DenoisePlanes(image, strength, true);
}
