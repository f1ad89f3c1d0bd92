// LightAdjust through the plug-in interface (Running on host memory frames), all four operations
// and each alone, beside memcpy of the same frame.
#include "BenchCommon.h"

namespace {

const struct Registrar {
  Registrar() {
    RegisterEffectCases("LightAdjust", L"D8651B53-F47A-4B98-B8E9-35B491D5EADC",
                        {
                            {"all4",
                             {{L"u_highLight", -40},
                              {L"u_shadow", 50},
                              {L"u_whiteLevel", 20},
                              {L"u_blackLevel", -15}}},
                            {"highlight", {{L"u_highLight", -40}}},
                            {"shadow", {{L"u_shadow", 50}}},
                            {"whiteLevel", {{L"u_whiteLevel", 20}}},
                            {"blackLevel", {{L"u_blackLevel", -15}}},
                        });
  }
} registrar;

}  // namespace
