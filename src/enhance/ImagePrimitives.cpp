// OpenCV behind the IPP-named primitives: every call wraps the caller's buffers and steps in
// cv::Mat headers without copying, checks what the IPP contract checks first, and turns
// OpenCV's exceptions into status codes so none leaves the plug-in.
#include "enhance/ImagePrimitives.h"

#include <climits>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <new>
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>

namespace {

constexpr int64_t kAlignment = 64;
constexpr std::align_val_t kAlign{kAlignment};

// Runs an OpenCV call that writes into `dst`. A Mat header over caller memory is never
// reallocated when size and type match; the pointer check makes sure of it.
template <class Call>
IppStatus RunInto(const cv::Mat& dst, const Ipp8u* pDst, Call call) {
  try {
    call();
  } catch (const std::bad_alloc&) {
    return ippStsNoMemErr;
  } catch (...) {
    return ippStsErr;
  }
  return dst.data == pDst ? ippStsNoErr : ippStsErr;
}

IppStatus FilterBox(const Ipp8u* pSrc, int srcStep, Ipp8u* pDst, int dstStep, IppiSize roi,
                    IppiSize mask, IppiPoint anchor, int channels) {
  if (!pSrc || !pDst) return ippStsNullPtrErr;
  if (roi.width < 1 || roi.height < 1) return ippStsSizeErr;
  if (mask.width < 1 || mask.height < 1) return ippStsMaskSizeErr;
  if (anchor.x < 0 || anchor.x >= mask.width || anchor.y < 0 || anchor.y >= mask.height) {
    return ippStsAnchorErr;
  }
  // The reach of all windows together: the region grown by the mask less one pixel.
  const int64_t reachWidth = int64_t{roi.width} + mask.width - 1;
  const int64_t reachHeight = int64_t{roi.height} + mask.height - 1;
  if (reachWidth * channels > INT_MAX || reachHeight > INT_MAX) return ippStsMaskSizeErr;
  if (srcStep < reachWidth * channels || dstStep < int64_t{roi.width} * channels) {
    return ippStsStepErr;
  }

  // OpenCV addresses its rows of running sums (up to 8 bytes per channel, up to twice the mask
  // height of them) with int offsets and fails beyond INT_MAX bytes.
  const int64_t sumRows = 2 * int64_t{mask.height} + 3;
  if (8 * channels * (int64_t{roi.width} + 64) * sumRows > INT_MAX) return ippStsNoMemErr;

  const int type = CV_8UC(channels);
  const Ipp8u* origin = pSrc - ptrdiff_t{anchor.y} * srcStep - ptrdiff_t{anchor.x} * channels;
  const cv::Mat reach(static_cast<int>(reachHeight), static_cast<int>(reachWidth), type,
                      const_cast<Ipp8u*>(origin), static_cast<std::size_t>(srcStep));
  // The region is a sub-matrix of the reach and the border is not isolated, so OpenCV takes
  // the caller's pixels around the region and never needs its border value.
  const cv::Mat region = reach(cv::Rect(anchor.x, anchor.y, roi.width, roi.height));
  cv::Mat dst(roi.height, roi.width, type, pDst, static_cast<std::size_t>(dstStep));
  const cv::Size size(mask.width, mask.height);
  const cv::Point point(anchor.x, anchor.y);
  const int64_t area = int64_t{mask.width} * mask.height;
  return RunInto(dst, pDst, [&] {
    if (area > 1 && area <= 256 && (area & (area - 1)) == 0) {
      // OpenCV's 16-bit sums divide by a fixed-point reciprocal that comes out one too high for
      // areas that are powers of two (a 2x1 mean of zeros gives 1): plain sums and an exact
      // scale instead, rounding halves to even.
      cv::Mat sums;
      cv::boxFilter(region, sums, CV_16U, size, point, false, cv::BORDER_CONSTANT);
      sums.convertTo(dst, CV_8U, 1.0 / static_cast<double>(area));
    } else {
      // Rounds to nearest; an exact half (even areas only) may go either way.
      cv::blur(region, dst, size, point, cv::BORDER_CONSTANT);
    }
  });
}

IppStatus CopyBorder(const Ipp8u* pSrc, int srcStep, IppiSize srcRoi, Ipp8u* pDst, int dstStep,
                     IppiSize dstRoi, int top, int left, int borderType, const cv::Scalar& value) {
  if (!pSrc || !pDst) return ippStsNullPtrErr;
  if (srcRoi.width < 1 || srcRoi.height < 1 || dstRoi.width < 1 || dstRoi.height < 1 || top < 0 ||
      left < 0 || int64_t{dstRoi.width} - left < srcRoi.width ||
      int64_t{dstRoi.height} - top < srcRoi.height) {
    return ippStsSizeErr;
  }
  if (srcStep < int64_t{srcRoi.width} * 4 || dstStep < int64_t{dstRoi.width} * 4) {
    return ippStsStepErr;
  }
  const cv::Mat src(srcRoi.height, srcRoi.width, CV_8UC4, const_cast<Ipp8u*>(pSrc),
                    static_cast<std::size_t>(srcStep));
  cv::Mat dst(dstRoi.height, dstRoi.width, CV_8UC4, pDst, static_cast<std::size_t>(dstStep));
  const int bottom = dstRoi.height - top - srcRoi.height;
  const int right = dstRoi.width - left - srcRoi.width;
  return RunInto(dst, pDst, [&] {
    cv::copyMakeBorder(src, dst, top, bottom, left, right, borderType | cv::BORDER_ISOLATED, value);
  });
}

void* AlignedAlloc(int64_t bytes) {
  if (bytes < 1 || bytes > INT_MAX) return nullptr;
  return ::operator new(static_cast<std::size_t>(bytes), kAlign, std::nothrow);
}

template <class T>
T* AllocVector(int len) {
  return static_cast<T*>(AlignedAlloc(int64_t{len} * static_cast<int64_t>(sizeof(T))));
}

}  // namespace

IppStatus ippiFilterBox_8u_C1R(const Ipp8u* pSrc, int srcStep, Ipp8u* pDst, int dstStep,
                               IppiSize dstRoiSize, IppiSize maskSize, IppiPoint anchor) {
  return FilterBox(pSrc, srcStep, pDst, dstStep, dstRoiSize, maskSize, anchor, 1);
}

IppStatus ippiFilterBox_8u_C4R(const Ipp8u* pSrc, int srcStep, Ipp8u* pDst, int dstStep,
                               IppiSize dstRoiSize, IppiSize maskSize, IppiPoint anchor) {
  return FilterBox(pSrc, srcStep, pDst, dstStep, dstRoiSize, maskSize, anchor, 4);
}

IppStatus ippiCopyReplicateBorder_8u_C4R(const Ipp8u* pSrc, int srcStep, IppiSize srcRoiSize,
                                         Ipp8u* pDst, int dstStep, IppiSize dstRoiSize,
                                         int topBorderHeight, int leftBorderWidth) {
  return CopyBorder(pSrc, srcStep, srcRoiSize, pDst, dstStep, dstRoiSize, topBorderHeight,
                    leftBorderWidth, cv::BORDER_REPLICATE, cv::Scalar());
}

IppStatus ippiCopyConstBorder_8u_C4R(const Ipp8u* pSrc, int srcStep, IppiSize srcRoiSize,
                                     Ipp8u* pDst, int dstStep, IppiSize dstRoiSize,
                                     int topBorderHeight, int leftBorderWidth,
                                     const Ipp8u value[4]) {
  if (!value) return ippStsNullPtrErr;
  return CopyBorder(pSrc, srcStep, srcRoiSize, pDst, dstStep, dstRoiSize, topBorderHeight,
                    leftBorderWidth, cv::BORDER_CONSTANT,
                    cv::Scalar(value[0], value[1], value[2], value[3]));
}

IppStatus ippiCopy_8u_C4R(const Ipp8u* pSrc, int srcStep, Ipp8u* pDst, int dstStep,
                          IppiSize roiSize) {
  if (!pSrc || !pDst) return ippStsNullPtrErr;
  if (roiSize.width < 1 || roiSize.height < 1) return ippStsSizeErr;
  const int64_t rowBytes = int64_t{roiSize.width} * 4;
  if (srcStep < rowBytes || dstStep < rowBytes) return ippStsStepErr;
  for (int y = 0; y < roiSize.height; ++y) {
    std::memcpy(pDst + ptrdiff_t{y} * dstStep, pSrc + ptrdiff_t{y} * srcStep,
                static_cast<std::size_t>(rowBytes));
  }
  return ippStsNoErr;
}

Ipp8u* ippiMalloc_8u_C4(int widthPixels, int heightPixels, int* pStepBytes) {
  if (!pStepBytes || widthPixels < 1 || heightPixels < 1) return nullptr;
  const int64_t step = (int64_t{widthPixels} * 4 + kAlignment - 1) / kAlignment * kAlignment;
  if (step > INT_MAX || step * heightPixels > INT_MAX) return nullptr;
  auto* image = static_cast<Ipp8u*>(AlignedAlloc(step * heightPixels));
  if (image) *pStepBytes = static_cast<int>(step);
  return image;
}

void* ippMalloc(int length) { return AlignedAlloc(length); }

void ippFree(void* ptr) { ::operator delete(ptr, kAlign); }

Ipp8u* ippsMalloc_8u(int len) { return AllocVector<Ipp8u>(len); }

Ipp16u* ippsMalloc_16u(int len) { return AllocVector<Ipp16u>(len); }

Ipp32s* ippsMalloc_32s(int len) { return AllocVector<Ipp32s>(len); }

Ipp32f* ippsMalloc_32f(int len) { return AllocVector<Ipp32f>(len); }

void ippsFree(void* ptr) { ippFree(ptr); }

IppStatus ippsSet_32f(Ipp32f val, Ipp32f* pDst, int len) {
  if (!pDst) return ippStsNullPtrErr;
  if (len < 1) return ippStsSizeErr;
  for (int i = 0; i < len; ++i) pDst[i] = val;
  return ippStsNoErr;
}
