// Frame and border compositing over 32-bit B, G, R, A buffers: a coloured outline around the
// opaque part of an image, an image's alpha scaled into a padded canvas, source-over blending
// with opacities, a centred cut-out, and a padded blur.
//
// Output buffers travel as a pointer to the caller's pointer plus its size: a function that
// needs another size releases the old buffer with delete[] and allocates a zero-filled one with
// new[], so a host can call it again and again with the same buffer and finally delete[] it.
// Output rows are width * 4 bytes; an image, mask or temporary above INT_MAX bytes is refused.
// Failures return 0 or false; the output may already have been reallocated by then.
//
// Threads: no state is shared between calls.
#pragma once

#include "tessarofx/Export.h"

// A colour passed by value; only the low byte of each field reaches a pixel.
struct PIPNLERGB {
  int red;
  int green;
  int blue;
  int alpha;  // opacity 0..255
};

// Releases *buffer when set and stores a zero-filled new[] block of width * height *
// bytesPerPixel bytes. False for a null `buffer`, a size below 1 or a block above INT_MAX bytes,
// which leave *buffer as it was.
TFX_API bool reMallocImage(unsigned char** buffer, int width, int height, int bytesPerPixel);

// A coloured outline `border` pixels wide around the pixels of `src` whose alpha is above 50,
// with a soft edge: the output, (w + 2 border) x (h + 2 border), is left as it was where the
// outline does not reach, and elsewhere gets the colour with alpha scaled by the outline's
// coverage (0 in the outermost `border` pixels). Border 0 copies the source. Returns 1, or 0 for a
// null pointer, bits per pixel other than 32, a negative border, a size below 1, a stride below
// width * 4, a source (stride * height), output or mask above INT_MAX bytes, or no memory.
TFX_API int makeImageFrame(unsigned char** out, int* outWidth, int* outHeight,
                           const unsigned char* src, int width, int height, int stride, int bpp,
                           PIPNLERGB color, int border);

// A (w + 2 border) x (h + 2 border) canvas of the colour whose alpha is the source's alpha
// scaled over the whole canvas, and 0 outside the inner area. Bytes 0, 1, 2 are blue, green,
// red here (the reverse of makeImageFrame's order). Source rows are width * 4 bytes. Returns 1,
// or 0 for a null pointer, bits per pixel other than 32, a negative border, a size below 1, an
// output above INT_MAX bytes, or no memory.
TFX_API int scaleImage(unsigned char** out, int* outWidth, int* outHeight, const unsigned char* src,
                       int width, int height, int bpp, PIPNLERGB color, int border);

// Source-over blend of a copyWidth x copyHeight block of `src` from (srcX, srcY) onto `dst` at
// (dstX, dstY) (negative positions clip), both images stored bottom-up, each alpha first scaled
// by its opacity in percent. -1 as a copy size means the source's. Integer arithmetic with
// truncating divisions. False for a null image, else true; sizes below 1, a source stride
// below its row, opacities outside 0..100, a block starting left of or above the source, or
// either image above INT_MAX bytes leave `dst` as it was.
TFX_API bool mergeImage(unsigned char* dst, const unsigned char* src, int dstWidth, int dstHeight,
                        int srcWidth, int srcHeight, int srcStride, int dstX, int dstY,
                        int copyWidth, int copyHeight, int srcX, int srcY, int srcOpacity,
                        int dstOpacity);

// Copies the centred dstWidth x dstHeight block of `src` into `dst`. False for a null image, a
// destination larger than the source, a stride below the row it must hold (strides count in
// whole pixels), or an image above INT_MAX bytes (stride * height); true, copying nothing, for a
// destination size below 1.
TFX_API bool clipOutBorder(const unsigned char* src, unsigned char* dst, int srcWidth,
                           int srcHeight, int srcStride, int dstWidth, int dstHeight,
                           int dstStride);

// Pads the source by `radius` pixels on every side with its edge pixels and box-blurs the
// result with a (2 radius + 1)^2 window that fades towards transparent black at the outer edge.
// The output is (w + 2 radius) x (h + 2 radius); radius 0 gives a copy. Source rows are
// width * 4 bytes. Returns 1, or 0 for a null pointer, bits per pixel other than 32, a size below
// 1, a negative radius, a source, output or temporary (another radius on every side) above
// INT_MAX bytes, or no memory.
TFX_API int blurImage(unsigned char** out, int* outWidth, int* outHeight, const unsigned char* src,
                      int width, int height, int bpp, int radius);
