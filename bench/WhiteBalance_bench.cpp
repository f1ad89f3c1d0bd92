// WhiteBalanceAdjust through the plug-in interface (Running on host memory frames), and the
// exported temperature, tint and automatic balance functions on a frame-sized CxImage, beside
// memcpy of the same frame.
#include <cstring>
#include <string>
#include <vector>

#include "BenchCommon.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/WhiteBalance.h"

namespace {

const struct Registrar {
  Registrar() {
    using ImageFn = CxImage* (*)(CxImage*);
    for (const BenchSize& size : kBenchSizes) {
      const std::string suffix = std::string("/") + size.label;
      RegisterMemcpy(size);
      RegisterTimed("BM_WhiteBalanceAdjust" + suffix, BM_EffectRunning, size,
                    L"39509FB9-39FB-4516-9464-3D891DD61D62",
                    Params{{L"u_temperature", 30}, {L"u_tint", -20}});
      RegisterTimed("BM_whiteBalanceAdjustment" + suffix, BM_ImageFunction<ImageFn>, size,
                    [](CxImage* i) { return whiteBalanceAdjustment(i, 50.0f); });
      RegisterTimed("BM_temperatureAdjustment" + suffix, BM_ImageFunction<ImageFn>, size,
                    [](CxImage* i) { return temperatureAdjustment(i, 4000); });
      RegisterTimed("BM_tintAdjustment" + suffix, BM_ImageFunction<ImageFn>, size,
                    [](CxImage* i) { return tintAdjustment(i, 40.0f); });
    }
  }
} registrar;

}  // namespace
