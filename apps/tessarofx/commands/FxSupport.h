// What the fx tables share: the image class over a matrix, and the runners for the common
// signatures.
#pragma once

#include <vector>

#include "commands/ImageFunctions.h"
#include "tessarofx/CxImage.h"

namespace tfxtool {

// A non-owning 32-bit BGRA CxImage over a matrix's pixels, alive for one call.
class WrappedImage {
 public:
  explicit WrappedImage(cv::Mat* bgra)
      : bits_(bgra->data),
        // The image keeps &bits_ as its owner's pointer variable, so bits_ must outlive it.
        image_(&bits_, static_cast<unsigned>(bgra->cols), static_cast<unsigned>(bgra->rows), 32,
               static_cast<unsigned>(bgra->step[0]), IPF_BGRA) {}
  CxImage* get() { return &image_; }

 private:
  unsigned char* bits_;
  CxImage image_;
};

// CxImage* f(CxImage*, float) with the first argument.
template <CxImage* (*Fn)(CxImage*, float)>
Status RunImageFloat(const FxContext& fx) {
  WrappedImage image(fx.image);
  Fn(image.get(), static_cast<float>(fx.values[0]));
  return Status::Ok();
}

// The argument i as the float the functions take.
inline float ArgF(const FxContext& fx, size_t i) { return static_cast<float>(fx.values[i]); }
inline int ArgI(const FxContext& fx, size_t i) { return static_cast<int>(fx.values[i]); }

// The enhancement library's part of the table.
const std::vector<ImageFunction>& EnhanceFunctions();

}  // namespace tfxtool
