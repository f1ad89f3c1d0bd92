// Frame and border compositing on 32-bit B, G, R, A buffers, over the IPP-named primitives.
//
// Sizes are checked in 64-bit arithmetic before anything is touched: every buffer allocated
// here, masks and temporaries included, is addressed through the primitives' int sizes and
// steps, so none may exceed INT_MAX bytes. Input a function cannot honour without reading or
// writing outside the caller's buffers fails, or for mergeImage leaves the destination as it is.
#include "tessarofx/Compositing.h"

#include <algorithm>
#include <climits>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <memory>
#include <new>

#include "base/ByteLimits.h"
#include "enhance/ImagePrimitives.h"

namespace {

// Row bytes of a 32-bit image, written as the bitmap formula it comes from.
int64_t RowBytes(int64_t width) { return (width * 32 + 31) / 32 * 4; }

// width x height x bytesPerPixel (all at least 1) fits in an int.
using Mask = std::unique_ptr<unsigned char[]>;

Mask ZeroedMask(int64_t bytes) { return Mask(new (std::nothrow) unsigned char[bytes]()); }

// Makes *out a width x height 32-bit image: kept as it is when it already has that size,
// otherwise released and replaced by a zero-filled one.
bool KeepOrResize(unsigned char** out, int* outWidth, int* outHeight, int width, int height) {
  if (*out && *outWidth == width && *outHeight == height) return true;
  if (!reMallocImage(out, width, height, 4)) return false;
  *outWidth = width;
  *outHeight = height;
  return true;
}

struct BlendWeights {
  int sourceAlpha;  // as
  int destAlpha;    // ad
  int destWeight;   // wd
  int total;
};

BlendWeights Weights(int sourceAlpha, int destAlpha, int sourceOpacity, int destOpacity) {
  const int as = sourceAlpha * sourceOpacity / 100;
  const int ad = destAlpha * destOpacity / 100;
  const int common = ad * as / 255;
  return {as, ad, ad - common, ad + as - common};
}

}  // namespace

bool reMallocImage(unsigned char** buffer, int width, int height, int bytesPerPixel) {
  if (!buffer || width < 1 || height < 1 || bytesPerPixel < 1) return false;
  if (!tfx::FitsInt(width, height, bytesPerPixel)) return false;
  unsigned char* old = *buffer;
  delete[] old;
  *buffer = new (std::nothrow) unsigned char[int64_t{width} * height * bytesPerPixel]();
  return *buffer != nullptr;
}

int makeImageFrame(unsigned char** out, int* outWidth, int* outHeight, const unsigned char* src,
                   int width, int height, int stride, int bpp, PIPNLERGB color, int border) {
  if (!out || !outWidth || !outHeight || !src || bpp != 32 || border < 0) return 0;
  if (width < 1 || height < 1 || stride < RowBytes(width)) return 0;
  if (!tfx::FitsInt(stride, height, 1)) return 0;
  if (border == 0) {
    if (!tfx::FitsInt(width, height, 4)) return 0;
    if (!KeepOrResize(out, outWidth, outHeight, width, height)) return 0;
    return ippiCopy_8u_C4R(src, stride, *out, width * 4, {width, height}) < 0 ? 0 : 1;
  }

  const int b = border;
  const int64_t w4 = int64_t{width} + 4 * int64_t{b};
  const int64_t h4 = int64_t{height} + 4 * int64_t{b};
  const int64_t w2 = int64_t{width} + 2 * int64_t{b};
  const int64_t h2 = int64_t{height} + 2 * int64_t{b};
  if (!tfx::FitsInt(w4, h4, 1) || !tfx::FitsInt(w2, h2, 4)) return 0;
  const int W4 = static_cast<int>(w4);
  const int W2 = static_cast<int>(w2);
  const int H2 = static_cast<int>(h2);

  // Masks are W4 x H4 with the source at (2b, 2b): the dilation and both box passes then read
  // inside the mask wherever their windows reach.
  Mask mask1 = ZeroedMask(w4 * h4);
  if (!mask1) return 0;
  if (!KeepOrResize(out, outWidth, outHeight, W2, H2)) return 0;
  for (int y = 0; y < height; ++y) {
    const unsigned char* row = src + ptrdiff_t{y} * stride;
    unsigned char* maskRow = mask1.get() + (ptrdiff_t{y} + 2 * b) * W4 + 2 * b;
    for (int x = 0; x < width; ++x) {
      if (row[x * 4 + 3] > 50) maskRow[x] = 255;
    }
  }

  Mask mask2 = ZeroedMask(w4 * h4);
  if (!mask2) return 0;
  const ptrdiff_t inner = ptrdiff_t{b} * W4 + b;
  const IppiSize region{W2, H2};
  const IppiSize window{2 * b + 1, 2 * b + 1};
  const IppiPoint centre{b, b};
  // Unchecked: the next pass runs with the same region and window and its status is checked.
  ippiFilterBox_8u_C1R(mask1.get() + inner, W4, mask2.get() + inner, W4, region, window, centre);
  std::replace_if(
      mask2.get(), mask2.get() + w4 * h4, [](unsigned char m) { return m != 0; }, 255);

  if (ippiFilterBox_8u_C1R(mask2.get() + inner, W4, mask1.get() + inner, W4, region, window,
                           centre) < 0) {
    std::puts("ippiFilterMedian_8u_C1R fail");
    return 0;
  }
  std::transform(mask1.get(), mask1.get() + w4 * h4, mask1.get(),
                 [](unsigned char m) { return static_cast<unsigned char>(m > 128 ? 255 : 0); });

  // The soft edge. Unchecked: a failure leaves the first pass's dilation in mask2.
  ippiFilterBox_8u_C1R(mask1.get() + W4 + 1, W4, mask2.get() + W4 + 1, W4,
                       {W4 - 2, static_cast<int>(h4) - 2}, {3, 3}, {1, 1});

  // Byte 0 takes red and byte 2 blue, the reverse of the pixels' own order.
  const auto red = static_cast<unsigned char>(color.red);
  const auto green = static_cast<unsigned char>(color.green);
  const auto blue = static_cast<unsigned char>(color.blue);
  for (int y = 0; y < H2; ++y) {
    const unsigned char* maskRow = mask2.get() + (ptrdiff_t{y} + b) * W4 + b;
    unsigned char* pixel = *out + ptrdiff_t{y} * W2 * 4;
    const bool innerRow = b <= y && y < H2 - b;
    for (int x = 0; x < W2; ++x, pixel += 4) {
      const int m = maskRow[x];
      if (m == 0) continue;
      pixel[0] = red;
      pixel[1] = green;
      pixel[2] = blue;
      pixel[3] = innerRow && b <= x && x < W2 - b
                     ? static_cast<unsigned char>(int64_t{color.alpha} * m / 255)
                     : 0;
    }
  }
  return 1;
}

int scaleImage(unsigned char** out, int* outWidth, int* outHeight, const unsigned char* src,
               int width, int height, int bpp, PIPNLERGB color, int border) {
  if (!out || !outWidth || !outHeight || !src || bpp != 32 || border < 0) return 0;
  if (width < 1 || height < 1) return 0;
  const int64_t w = int64_t{width} + 2 * int64_t{border};
  const int64_t h = int64_t{height} + 2 * int64_t{border};
  if (!tfx::FitsInt(w, h, 4)) return 0;
  const int W = static_cast<int>(w);
  const int H = static_cast<int>(h);
  const int b = border;
  *outWidth = W;
  *outHeight = H;
  if (!reMallocImage(out, W, H, 4)) return 0;

  const auto red = static_cast<unsigned char>(color.red);
  const auto green = static_cast<unsigned char>(color.green);
  const auto blue = static_cast<unsigned char>(color.blue);
  // The whole canvas, border included, maps onto the source, in float; the limits keep float
  // rounding from stepping past the source's last row or column.
  const float stepX = 1.0f / static_cast<float>(W);
  const float stepY = 1.0f / static_cast<float>(H);
  unsigned char* pixel = *out;
  for (int y = 0; y < H; ++y) {
    // The upper limits are inclusive: one row and column past the inner area keep an alpha.
    const bool alphaRow = b <= y && y <= H - b;
    const int sy = std::min(static_cast<int>(static_cast<float>(y) * stepY * height), height - 1);
    const unsigned char* sourceRow = src + ptrdiff_t{sy} * width * 4;
    for (int x = 0; x < W; ++x, pixel += 4) {
      pixel[0] = blue;
      pixel[1] = green;
      pixel[2] = red;
      if (alphaRow && b <= x && x <= W - b) {
        const int sx = std::min(static_cast<int>(static_cast<float>(x) * stepX * width), width - 1);
        pixel[3] = sourceRow[sx * 4 + 3];
      }
    }
  }
  return 1;
}

bool mergeImage(unsigned char* dst, const unsigned char* src, int dstWidth, int dstHeight,
                int srcWidth, int srcHeight, int srcStride, int dstX, int dstY, int copyWidth,
                int copyHeight, int srcX, int srcY, int srcOpacity, int dstOpacity) {
  if (!dst || !src) return false;
  if (dstWidth < 1 || dstHeight < 1 || srcWidth < 1 || srcHeight < 1 ||
      srcStride < RowBytes(srcWidth)) {
    return true;
  }
  if (srcOpacity < 0 || srcOpacity > 100 || dstOpacity < 0 || dstOpacity > 100) return true;
  // Images above INT_MAX bytes are refused, as everywhere in this file; a destination far beyond
  // that would also take its row offsets past 64 bits.
  if (!tfx::FitsInt(dstWidth, dstHeight, 4) || int64_t{srcStride} * srcHeight > INT_MAX)
    return true;

  // A negative destination position clips the block and moves its source origin along.
  const int64_t clipX = std::min(dstX, 0);
  const int64_t clipY = std::min(dstY, 0);
  const int64_t sx = srcX - clipX;
  const int64_t sy = srcY - clipY;
  const int64_t dx = std::max(dstX, 0);
  const int64_t dy = std::max(dstY, 0);
  const int64_t blockWidth = copyWidth == -1 ? srcWidth : copyWidth;
  const int64_t blockHeight = copyHeight == -1 ? srcHeight : copyHeight;
  const int64_t width = std::min({blockWidth + clipX, dstWidth - dx, srcWidth - sx});
  const int64_t height = std::min({blockHeight + clipY, dstHeight - dy, srcHeight - sy});
  if (height < 1) return true;
  // Nothing lies left of or above the source.
  if (width < 1 || sx < 0 || sy < 0) return true;

  const int64_t dstRow = RowBytes(dstWidth);
  int lastSource = 255;
  int lastDest = 255;
  BlendWeights weights = Weights(255, 255, srcOpacity, dstOpacity);
  for (int64_t i = 0; i < height; ++i) {
    // Rows are stored bottom-up.
    const unsigned char* s = src + (srcHeight - 1 - (sy + i)) * srcStride + sx * 4;
    unsigned char* d = dst + (dstHeight - 1 - (dy + i)) * dstRow + dx * 4;
    for (int64_t j = 0; j < width; ++j, s += 4, d += 4) {
      if (s[3] != lastSource || d[3] != lastDest) {
        lastSource = s[3];
        lastDest = d[3];
        weights = Weights(lastSource, lastDest, srcOpacity, dstOpacity);
      }
      if (weights.total == 0) {
        std::memset(d, 0, 4);
        continue;
      }
      for (int c = 0; c < 3; ++c) {
        d[c] = static_cast<unsigned char>((d[c] * weights.destWeight + s[c] * weights.sourceAlpha) /
                                          weights.total);
      }
      d[3] = static_cast<unsigned char>((255 - weights.sourceAlpha) * weights.destAlpha / 255 +
                                        weights.sourceAlpha);
    }
  }
  return true;
}

bool clipOutBorder(const unsigned char* src, unsigned char* dst, int srcWidth, int srcHeight,
                   int srcStride, int dstWidth, int dstHeight, int dstStride) {
  if (!src || !dst || dstWidth > srcWidth || dstHeight > srcHeight) return false;
  if (dstHeight < 1 || dstWidth < 1) return true;
  // Rows advance by whole pixels: a stride that is not a multiple of 4 drops its remainder.
  const int srcPitch = srcStride / 4;
  const int dstPitch = dstStride / 4;
  if (srcPitch < srcWidth || dstPitch < dstWidth) return false;
  if (!tfx::FitsInt(srcStride, srcHeight, 1) || !tfx::FitsInt(dstStride, dstHeight, 1))
    return false;
  const int top = (srcHeight - dstHeight) / 2;
  const int left = (srcWidth - dstWidth) / 2;
  for (int y = 0; y < dstHeight; ++y) {
    std::memcpy(dst + ptrdiff_t{y} * dstPitch * 4,
                src + ((ptrdiff_t{top} + y) * srcPitch + left) * 4, size_t{4} * dstWidth);
  }
  return true;
}

int blurImage(unsigned char** out, int* outWidth, int* outHeight, const unsigned char* src,
              int width, int height, int bpp, int radius) {
  if (!out || !outWidth || !outHeight || !src || bpp != 32) return 0;
  if (width < 1 || height < 1 || radius < 0 || !tfx::FitsInt(width, height, 4)) return 0;
  const int64_t w = int64_t{width} + 2 * int64_t{radius};
  const int64_t h = int64_t{height} + 2 * int64_t{radius};
  // The temporary is another radius wider on every side.
  if (!tfx::FitsInt(w + 2 * int64_t{radius}, h + 2 * int64_t{radius}, 4)) return 0;
  const int W = static_cast<int>(w);
  const int H = static_cast<int>(h);
  const int r = radius;
  *outWidth = W;
  *outHeight = H;
  if (!reMallocImage(out, W, H, 4)) return 0;

  const int outStep = static_cast<int>(RowBytes(W));
  if (ippiCopyReplicateBorder_8u_C4R(src, static_cast<int>(RowBytes(width)), {width, height}, *out,
                                     outStep, {W, H}, r, r) < 0) {
    return 0;
  }
  int tempStep = 0;
  const std::unique_ptr<Ipp8u, void (*)(void*)> temp(
      ippiMalloc_8u_C4(W + 2 * r, H + 2 * r, &tempStep), ippFree);
  if (!temp) return 0;
  const Ipp8u transparentBlack[4] = {0, 0, 0, 0};
  if (ippiCopyConstBorder_8u_C4R(*out, outStep, {W, H}, temp.get(), tempStep,
                                 {W + 2 * r, H + 2 * r}, r, r, transparentBlack) < 0) {
    return 0;
  }
  // The replicated margin blurs together with the image and fades into the black around it.
  if (ippiFilterBox_8u_C4R(temp.get() + ptrdiff_t{r} * tempStep + ptrdiff_t{r} * 4, tempStep, *out,
                           outStep, {W, H}, {2 * r + 1, 2 * r + 1}, {r, r}) < 0) {
    return 0;
  }
  return 1;
}
