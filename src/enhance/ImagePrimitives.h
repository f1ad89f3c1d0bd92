// The few image primitives the compositing functions are written against, under the names,
// signatures and status codes of Intel IPP's functions of the same names so that the calling
// code reads as it was designed. OpenCV computes them; its own CPU dispatch picks the vector
// code, so each primitive has one entry point and no per-processor variants.
//
// Internal: hidden in the plug-in, never published. Steps (strides) are in bytes; sizes are
// (width, height) in pixels. A negative status is an error and leaves the destination as it
// was. Source and destination must not overlap.
#pragma once

using Ipp8u = unsigned char;
using Ipp16u = unsigned short;
using Ipp32s = int;
using Ipp32f = float;

struct IppiSize {
  int width;
  int height;
};

struct IppiPoint {
  int x;
  int y;
};

using IppStatus = int;
constexpr IppStatus ippStsNoErr = 0;
constexpr IppStatus ippStsErr = -2;  // an unexpected failure inside OpenCV
constexpr IppStatus ippStsNoMemErr = -4;
constexpr IppStatus ippStsSizeErr = -6;
constexpr IppStatus ippStsNullPtrErr = -8;
constexpr IppStatus ippStsStepErr = -14;
constexpr IppStatus ippStsMaskSizeErr = -33;
constexpr IppStatus ippStsAnchorErr = -34;

// Mean of the maskSize window around each pixel of the dstRoiSize region. The window of
// destination pixel (x, y) covers source columns x - anchor.x .. x - anchor.x + mask width - 1
// and the rows likewise, so the caller guarantees that much memory around pSrc (there is no
// border handling). Averages round to the nearest integer; an exact half (only possible for a
// mask of even area) may go either way.
// Errors: ippStsNullPtrErr, ippStsSizeErr (region below 1x1), ippStsMaskSizeErr (mask below
// 1x1, or a window whose span overflows int), ippStsAnchorErr (anchor outside the mask),
// ippStsStepErr (a step below the row it must hold: the region for pDst, the window's reach for
// pSrc), ippStsNoMemErr.
IppStatus ippiFilterBox_8u_C1R(const Ipp8u* pSrc, int srcStep, Ipp8u* pDst, int dstStep,
                               IppiSize dstRoiSize, IppiSize maskSize, IppiPoint anchor);
// The same on four interleaved channels, each filtered on its own.
IppStatus ippiFilterBox_8u_C4R(const Ipp8u* pSrc, int srcStep, Ipp8u* pDst, int dstStep,
                               IppiSize dstRoiSize, IppiSize maskSize, IppiPoint anchor);

// Copies srcRoiSize into dstRoiSize at (leftBorderWidth, topBorderHeight) and fills every
// destination pixel around it with the nearest source pixel.
// Errors: ippStsNullPtrErr, ippStsSizeErr (a size below 1x1, a negative border, or a
// destination too small for the source at that offset), ippStsStepErr, ippStsNoMemErr.
IppStatus ippiCopyReplicateBorder_8u_C4R(const Ipp8u* pSrc, int srcStep, IppiSize srcRoiSize,
                                         Ipp8u* pDst, int dstStep, IppiSize dstRoiSize,
                                         int topBorderHeight, int leftBorderWidth);
// The same, filling the border with the pixel `value` (four bytes in memory order).
IppStatus ippiCopyConstBorder_8u_C4R(const Ipp8u* pSrc, int srcStep, IppiSize srcRoiSize,
                                     Ipp8u* pDst, int dstStep, IppiSize dstRoiSize,
                                     int topBorderHeight, int leftBorderWidth,
                                     const Ipp8u value[4]);

// Copies a region of four-channel pixels between two steps.
// Errors: ippStsNullPtrErr, ippStsSizeErr, ippStsStepErr.
IppStatus ippiCopy_8u_C4R(const Ipp8u* pSrc, int srcStep, Ipp8u* pDst, int dstStep,
                          IppiSize roiSize);

// A 64-byte aligned four-channel image whose rows are padded to 64 bytes; the step goes to
// *pStepBytes. Null for a null pStepBytes, a size below 1x1, more than INT_MAX bytes or no
// memory. Released with ippFree.
Ipp8u* ippiMalloc_8u_C4(int widthPixels, int heightPixels, int* pStepBytes);

// 64-byte aligned vectors of `len` elements (`length` bytes for ippMalloc); null for a length
// below 1, more than INT_MAX bytes or no memory. ippsFree and ippFree release any of them;
// null is ignored.
Ipp8u* ippsMalloc_8u(int len);
Ipp16u* ippsMalloc_16u(int len);
Ipp32s* ippsMalloc_32s(int len);
Ipp32f* ippsMalloc_32f(int len);
void ippsFree(void* ptr);
void* ippMalloc(int length);
void ippFree(void* ptr);

// Sets `len` floats to `val`. Errors: ippStsNullPtrErr, ippStsSizeErr.
IppStatus ippsSet_32f(Ipp32f val, Ipp32f* pDst, int len);
