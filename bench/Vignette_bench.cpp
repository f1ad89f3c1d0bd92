// VignetteAdjust through the plug-in interface (Running on host memory frames) beside memcpy of
// the same frame: the default shape with and without the tone curve outside, and a small,
// fully feathered ellipse where nearly every pixel is blended one by one.
#include "BenchCommon.h"

namespace {

const struct Registrar {
  Registrar() {
    RegisterEffectCases(
        "Vignette", L"8622FC58-4DF1-44BD-9B37-2F633D4D3368",
        {
            {"darken", {{L"amount", -50}}},
            {"darken_highlights", {{L"amount", -50}, {L"highlights", 80}, {L"exposure", 20}}},
            {"small_feathered",
             {{L"amount", 60}, {L"size", 0}, {L"feather", 100}, {L"highlights", 20}}},
        });
  }
} registrar;

}  // namespace
