// ColorAdjust through the plug-in interface (Running on host memory frames), all five operations
// and each alone, beside memcpy of the same frame.
#include "BenchCommon.h"

namespace {

const struct Registrar {
  Registrar() {
    RegisterEffectCases("ColorAdjust", L"18C6E879-4138-42D0-B0B9-6B4401AA97E6",
                        {
                            {"all5",
                             {{L"u_exposure", 20},
                              {L"u_brightness", 15},
                              {L"u_contrast", 30},
                              {L"u_vib", 40},
                              {L"u_sat", 25}}},
                            {"exposure", {{L"u_exposure", 20}}},
                            {"brightness", {{L"u_brightness", 15}}},
                            {"contrast", {{L"u_contrast", 30}}},
                            {"vibrance", {{L"u_vib", 40}}},
                            {"saturation", {{L"u_sat", 25}}},
                        });
  }
} registrar;

}  // namespace
