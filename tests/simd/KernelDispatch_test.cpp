// Every kernel family is picked by Highway's dispatch at the call, so forcing one target at a time
// (as every ForEveryTarget test does) runs that target's kernels and no cached choice.
#include <gtest/gtest.h>

#include <cstdint>
#include <iostream>

#include <hwy/targets.h>

#include "adjust/VignetteRows.h"
#include "simd/box_rows.h"
#include "simd/color_adjust_rows.h"
#include "simd/dct8.h"
#include "simd/detail_rows.h"
#include "simd/hsl_adjust_rows.h"
#include "simd/hsl_relight.h"
#include "simd/hsl_rows.h"
#include "simd/hue_rotate.h"
#include "simd/lens_resample.h"
#include "simd/lut_tetra_rows.h"
#include "simd/stackblur_lanes.h"
#include "simd/window_histogram.h"

namespace {

TEST(KernelDispatch, EveryFamilyFollowsTheTargetInForce) {
  std::cout << "[ targets  ]";
  for (const int64_t target : hwy::SupportedAndGeneratedTargets()) {
    const char* const name = hwy::TargetName(target);
    SCOPED_TRACE(name);
    std::cout << ' ' << name;
    hwy::SetSupportedTargetsForTest(target);
    for (const char* family :
         {tfx::BestColorAdjustRows().name, tfx::BestHslRelightRows().name,
          tfx::BestLensResampleRows().name, tfx::BestVignetteKernel().name, tfx::BoxRowsTarget(),
          tfx::Dct8Target(), tfx::DetailRowsTarget(), tfx::HslAdjustRowsTarget(),
          tfx::HslRowsTarget(), tfx::HueRotateTarget(), tfx::TetraRowVectorTarget(),
          tfx::StackblurLanesTarget(), tfx::WindowHistogramTarget()}) {
      EXPECT_STREQ(family, name);
    }
  }
  hwy::SetSupportedTargetsForTest(0);
  std::cout << std::endl;
}

}  // namespace
