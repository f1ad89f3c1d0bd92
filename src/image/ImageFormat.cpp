#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <new>

#include "base/Assert.h"
#include "image/ImageLayout.h"
#include "tessarofx/CxImage.h"

namespace {

uint32_t BytesPerPixelFor(uint32_t bpp) {
  switch (bpp) {
    case 8:
      return 1;
    case 16:
      return 2;
    case 24:
      return 3;
    case 32:
      return 4;
    default:
      return 0;
  }
}

tagRGBQUAD Quad(uint8_t blue, uint8_t green, uint8_t red, uint8_t alpha) {
  return tagRGBQUAD{blue, green, red, alpha};
}

uint32_t QuadWord(tagRGBQUAD c) {
  return c.rgbBlue | (uint32_t(c.rgbGreen) << 8) | (uint32_t(c.rgbRed) << 16) |
         (uint32_t(c.rgbReserved) << 24);
}

// The 16-bit layouts put the first named colour in the low 5 bits and mask every field with 8
// bits, so neighbouring fields (and the sign of the word) leak into green and the top colour.
void Unpack16(const uint8_t* p, uint8_t* low, uint8_t* green, uint8_t* high) {
  int16_t half;
  std::memcpy(&half, p, sizeof half);
  const int w = half;
  *low = static_cast<uint8_t>(w & 31);
  *green = static_cast<uint8_t>((w >> 5) & 255);
  *high = static_cast<uint8_t>((w >> 11) & 255);
}

// Where pixel (x, y) starts, or -1 when its bytes would end past `size`. Coordinates inside the
// image always fit a buffer whose header is sound; the check keeps a header with a short stride
// or a wrapped size from reaching further than the bytes it claims.
int64_t PixelOffset(unsigned long x, unsigned long y, uint32_t effWidth, uint32_t bytesPerPixel,
                    uint32_t size) {
  const uint64_t offset = uint64_t{y} * effWidth + uint64_t{x} * bytesPerPixel;
  return offset + bytesPerPixel <= size ? static_cast<int64_t>(offset) : -1;
}

void Pack16(uint8_t* p, tagRGBQUAD c, uint32_t low, uint32_t high) {
  // The green term is added, not or-ed: its carries run into the neighbouring fields.
  const uint32_t word = (low | (high << 11)) + ((QuadWord(c) >> 3) & 0x1fe0);
  const uint16_t half = static_cast<uint16_t>(word);
  std::memcpy(p, &half, sizeof half);
}

}  // namespace

uint8_t ClampToByte(int value) {
  if (value < 0) return 0;
  if (value > 255) return 255;
  return static_cast<uint8_t>(value);
}

CxImage::CxImage()
    : bits(nullptr),
      externalBits(nullptr),
      ownsBits(1),
      width(0),
      height(0),
      bpp(0),
      bytesPerPixel(0),
      effWidth(0),
      size(0),
      format(IPF_None) {}

CxImage::CxImage(unsigned int w, unsigned int h, unsigned int nBpp, _ImagePixelFormat fmt)
    : CxImage() {
  Create(w, h, nBpp, fmt);
}

CxImage::CxImage(unsigned char** ppBits, unsigned int w, unsigned int h, unsigned int nBpp,
                 unsigned int stride, _ImagePixelFormat fmt)
    : bits(ppBits ? *ppBits : nullptr),
      externalBits(ppBits),
      ownsBits(0),
      width(w),
      height(h),
      bpp(nBpp),
      bytesPerPixel(BytesPerPixelFor(nBpp)),
      effWidth(stride),
      size(h * stride),
      format(nBpp == 8 ? IPF_Gray8 : fmt) {}

CxImage::~CxImage() { Destroy(); }

void CxImage::Destroy() {
  if (bits && ownsBits) {
    delete[] bits;
    bits = nullptr;
  }
  width = height = bpp = bytesPerPixel = effWidth = size = 0;
  format = IPF_None;
}

CxImage* CxImage::Create(unsigned int w, unsigned int h, unsigned int nBpp, _ImagePixelFormat fmt) {
  // A wrapped buffer holds what its header claimed and no more: the header may shrink, not grow.
  const bool wrapped = !ownsBits && bits;
  const uint32_t capacity = size;
  Destroy();
  if (w == 0 || h == 0 || nBpp == 0) return nullptr;

  // In 64 bits: the row and the whole buffer must each fit their 32-bit field, or the buffer
  // allocated would be a wrapped-around fraction of what the header describes.
  const uint64_t rowBytes = ((uint64_t{nBpp} * w + 31) >> 3) & ~uint64_t{3};
  if (rowBytes > UINT32_MAX || rowBytes * h > UINT32_MAX) return nullptr;
  if (wrapped && rowBytes * h > capacity) return nullptr;

  bytesPerPixel = BytesPerPixelFor(nBpp);
  width = w;
  height = h;
  bpp = nBpp;
  effWidth = static_cast<uint32_t>(rowBytes);
  size = effWidth * h;
  if (ownsBits) {
    // Left uninitialised on purpose: every caller overwrites the pixels.
    bits = new (std::nothrow) uint8_t[size];
    if (!bits) {
      Destroy();
      return nullptr;
    }
  }
  format = bytesPerPixel == 1 ? IPF_Gray8 : fmt;
  return this;
}

tagRGBQUAD CxImage::GetPixelColor(unsigned long x, unsigned long y, bool bGetAlpha) const {
  const tagRGBQUAD zero = Quad(0, 0, 0, 0);
  if (!bits || x >= width || y >= height || format == IPF_None) return zero;
  const int64_t offset = PixelOffset(x, y, effWidth, bytesPerPixel, size);
  if (offset < 0) return zero;
  const uint8_t* p = bits + offset;
  uint8_t c0, c1, c2;
  switch (format) {
    case IPF_Gray8:
      return bytesPerPixel == 1 ? Quad(p[0], p[0], p[0], p[0]) : zero;
    case IPF_RGB:
      if (bytesPerPixel == 3) return Quad(p[2], p[1], p[0], 0);
      if (bytesPerPixel != 2) return zero;
      Unpack16(p, &c0, &c1, &c2);
      return Quad(c0, c1, c2, 0);
    case IPF_BGR:
      if (bytesPerPixel == 3) return Quad(p[0], p[1], p[2], 0);
      if (bytesPerPixel != 2) return zero;
      Unpack16(p, &c0, &c1, &c2);
      return Quad(c2, c1, c0, 0);
    case IPF_RGBA:
      if (bytesPerPixel != 4) return zero;
      return Quad(p[2], p[1], p[0], bGetAlpha ? p[3] : 0);
    case IPF_BGRA:
      if (bytesPerPixel != 4) return zero;
      return Quad(p[0], p[1], p[2], bGetAlpha ? p[3] : 0);
    default:
      return zero;
  }
}

void CxImage::SetPixelColor(unsigned long x, unsigned long y, tagRGBQUAD c) {
  if (!bits || x >= width || y >= height || format == IPF_None) return;
  const int64_t offset = PixelOffset(x, y, effWidth, bytesPerPixel, size);
  if (offset < 0) return;
  uint8_t* p = bits + offset;
  switch (format) {
    case IPF_Gray8:
      if (bytesPerPixel == 1) p[0] = c.rgbRed;
      break;
    case IPF_RGB:
      if (bytesPerPixel == 3) {
        p[0] = c.rgbRed;
        p[1] = c.rgbGreen;
        p[2] = c.rgbBlue;
      } else if (bytesPerPixel == 2) {
        Pack16(p, c, c.rgbBlue, c.rgbRed);
      }
      break;
    case IPF_BGR:
      if (bytesPerPixel == 3) {
        p[0] = c.rgbBlue;
        p[1] = c.rgbGreen;
        p[2] = c.rgbRed;
      } else if (bytesPerPixel == 2) {
        Pack16(p, c, c.rgbRed, c.rgbBlue);
      }
      break;
    case IPF_RGBA:
      if (bytesPerPixel == 4) {
        p[0] = c.rgbRed;
        p[1] = c.rgbGreen;
        p[2] = c.rgbBlue;
        p[3] = c.rgbReserved;
      }
      break;
    case IPF_BGRA:
      if (bytesPerPixel == 4) {
        p[0] = c.rgbBlue;
        p[1] = c.rgbGreen;
        p[2] = c.rgbRed;
        p[3] = c.rgbReserved;
      }
      break;
    default:
      break;
  }
}

void CxImage::Copy(const CxImage* src) {
  if (!src) return;
  // A buffer of the same dimensions may still be smaller than the source's (another stride).
  if (bits &&
      (width != src->width || height != src->height || bpp != src->bpp || size < src->size)) {
    // A wrapped buffer goes too; the caller learns of it through its cleared pointer.
    delete[] bits;
    bits = nullptr;
    if (!ownsBits && externalBits) *externalBits = nullptr;
  }
  // The header, not `externalBits`: that pointer names this image's caller, not the source's.
  ownsBits = src->ownsBits;
  width = src->width;
  height = src->height;
  bpp = src->bpp;
  bytesPerPixel = src->bytesPerPixel;
  effWidth = src->effWidth;
  size = src->size;
  format = src->format;
  if (!bits) {
    bits = new (std::nothrow) uint8_t[size];
    if (!bits) {
      Destroy();
      return;
    }
    ownsBits = 1;
  }
  if (src->bits && bits != src->bits && size) std::memcpy(bits, src->bits, size);
}

void CxImage::Copy(const CxImage& src) {
  if (!src.bits) return;
  if (bits && (width != src.width || height != src.height || bpp != src.bpp || size < src.size)) {
    delete[] bits;
    bits = nullptr;
    if (!ownsBits && externalBits) *externalBits = nullptr;
  }
  width = src.width;
  height = src.height;
  bpp = src.bpp;
  bytesPerPixel = src.bytesPerPixel;
  effWidth = src.effWidth;
  size = src.size;
  format = src.format;
  if (!bits) {
    bits = new (std::nothrow) uint8_t[size];
    if (!bits) {
      Destroy();
      return;
    }
    ownsBits = 1;
  }
  if (bits != src.bits && size) std::memcpy(bits, src.bits, size);
}

bool CxImage::SplitRGBA(CxImage* r, CxImage* g, CxImage* b, CxImage* a) {
  if (!bits || (!r && !g && !b) || format == IPF_Gray8 || format == IPF_None) return false;
  if (!tfx::HasConsistentLayout(*this)) return false;
  CxImage* planes[4] = {r, g, b, a};
  for (CxImage* plane : planes) {
    if (plane) plane->Create(width, height, 8, IPF_Gray8);
  }
  // An empty size has no pixels, however many rows of none it claims.
  if (width == 0 || height == 0) return true;
  for (unsigned long y = 0; y < height; ++y) {
    for (unsigned long x = 0; x < width; ++x) {
      const tagRGBQUAD c = GetPixelColor(x, y, true);
      const uint8_t values[4] = {c.rgbRed, c.rgbGreen, c.rgbBlue, c.rgbReserved};
      for (int i = 0; i < 4; ++i) {
        if (planes[i]) planes[i]->SetPixelColor(x, y, Quad(0, 0, values[i], 0));
      }
    }
  }
  return true;
}

bool CxImage::SplitHSLA(CxImage* r, CxImage* g, CxImage* b, CxImage* a) {
  if (!bits || (!r && !g && !b) || format == IPF_Gray8 || format == IPF_None) return false;
  if (!tfx::HasConsistentLayout(*this)) return false;
  CxImage* planes[4] = {r, g, b, a};
  for (CxImage* plane : planes) {
    if (plane) plane->Create(width, height, 8, IPF_Gray8);
  }
  // An empty size has no pixels, however many rows of none it claims.
  if (width == 0 || height == 0) return true;
  for (unsigned long y = 0; y < height; ++y) {
    for (unsigned long x = 0; x < width; ++x) {
      const tagRGBQUAD c = GetPixelColor(x, y, true);
      const tagRGBQUAD hsl = RGBtoHSL(c);
      const uint8_t values[4] = {hsl.rgbRed, hsl.rgbGreen, hsl.rgbBlue, c.rgbReserved};
      for (int i = 0; i < 4; ++i) {
        if (planes[i]) planes[i]->SetPixelColor(x, y, Quad(0, 0, values[i], 0));
      }
    }
  }
  return true;
}

bool CxImage::Combine(CxImage* r, CxImage* g, CxImage* b, CxImage* a, int colorspace) {
  if (!r || !g || !b) return false;
  const uint32_t rw = r->GetWidth(), gw = g->GetWidth(), bw = b->GetWidth();
  const uint32_t rh = r->GetHeight(), gh = g->GetHeight(), bh = b->GetHeight();
  if (a) {
    const uint32_t aw = a->GetWidth(), ah = a->GetHeight();
    TFX_ASSERT((rw == gw && gw == bw && bw == aw) && (rh == gh && gh == bh && bh == ah) &&
               (r->GetBpp() == g->GetBpp() && g->GetBpp() == b->GetBpp() &&
                b->GetBpp() == a->GetBpp() && a->GetBpp() == 8));
  } else {
    TFX_ASSERT((rw == gw && gw == bw) && (rh == gh && gh == bh) &&
               (r->GetBpp() == g->GetBpp() && g->GetBpp() == b->GetBpp() && b->GetBpp() == 8));
  }

  // Planes without pixels leave this image empty, as ever; a size it cannot take (no bpp, too
  // many bytes, more than a wrapped buffer holds) is a failure.
  if (!Create(rw, rh, bpp, format) && rw != 0 && rh != 0) return false;
  for (unsigned long y = 0; y < rh; ++y) {
    for (unsigned long x = 0; x < rw; ++x) {
      tagRGBQUAD c =
          Quad(b->GetPixelColor(x, y, true).rgbBlue, g->GetPixelColor(x, y, true).rgbGreen,
               r->GetPixelColor(x, y, true).rgbRed, 0);
      if (colorspace == 1) c = HSLtoRGB(c);
      c.rgbReserved =
          a ? a->GetPixelColor(x, y, true).rgbReserved : GetPixelColor(x, y, true).rgbReserved;
      SetPixelColor(x, y, c);
    }
  }
  return true;
}

tagRGBQUAD CxImage::RGBtoHSL(tagRGBQUAD c) {
  const int r = c.rgbRed, g = c.rgbGreen, b = c.rgbBlue;
  int cMax = r > g ? r : g;
  if (b > cMax) cMax = b;
  int cMin = r < g ? r : g;
  if (b < cMin) cMin = b;

  const int l = ((cMax + cMin) * 255 + 255) / 510;
  if (cMax == cMin) return Quad(static_cast<uint8_t>(l), 0, 170, 0);

  const int d = cMax - cMin;
  const int sum = cMax + cMin;
  const int s = l <= 127 ? (d * 255 + sum / 2) / sum : (d * 255 + (510 - sum) / 2) / (510 - sum);
  // 42 is 255 / 6 in integers: one sixth of the hue circle.
  const int rDelta = ((cMax - r) * 42 + d / 2) / d;
  const int gDelta = ((cMax - g) * 42 + d / 2) / d;
  const int bDelta = ((cMax - b) * 42 + d / 2) / d;
  int h;
  if (r == cMax) {
    h = bDelta - gDelta;
  } else if (g == cMax) {
    h = 85 + rDelta - bDelta;
  } else {
    h = 170 + gDelta - rDelta;
  }
  // Only the low byte is kept: a negative hue wraps modulo 256, not 255.
  return Quad(static_cast<uint8_t>(l), static_cast<uint8_t>(s), static_cast<uint8_t>(h & 255), 0);
}

float CxImage::HueToRGB(float p, float q, float hue) {
  if (hue > 360.0f) {
    hue -= 360.0f;
  } else if (hue < 0.0f) {
    hue += 360.0f;
  }
  if (hue < 60.0f) return p + (q - p) * hue / 60.0f;
  if (hue < 180.0f) return q;
  if (hue < 240.0f) return p + (q - p) * (240.0f - hue) / 60.0f;
  return p;
}

tagRGBQUAD CxImage::HSLtoRGB(tagRGBQUAD hsl) {
  const float s = hsl.rgbGreen / 255.0f;
  const float l = hsl.rgbBlue / 255.0f;
  const float q = l <= 0.5f ? (1.0f + s) * l : l + s - l * s;
  if (s == 0.0f) {
    const uint8_t grey = static_cast<uint8_t>(static_cast<int>(l * 255.0f));
    return Quad(grey, grey, grey, 0);
  }
  // Hue in float, from the exact integer product H * 360.
  const float h = static_cast<float>(hsl.rgbRed * 360) / 255.0f;
  const float p = 2.0f * l - q;
  const auto toByte = [](float v) { return static_cast<uint8_t>(static_cast<int>(v * 255.0f)); };
  return Quad(toByte(HueToRGB(p, q, h - 120.0f)), toByte(HueToRGB(p, q, h)),
              toByte(HueToRGB(p, q, h + 120.0f)), 0);
}
