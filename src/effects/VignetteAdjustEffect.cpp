// VignetteAdjust: darkens or lightens the frame towards its edges.
#include "plugin/NLEDynamicEffect.h"

namespace {

// The pixel work of this effect is not part of this build: Transform keeps the base answer
// (not implemented), so hosts see a clean failure rather than an unchanged frame.
class NLEVignetteAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEVignetteAdjustEffect(); }
};

const NLEVignetteAdjustEffect::_auto_register s_register(L"8622FC58-4DF1-44BD-9B37-2F633D4D3368",
                                                         L"VignetteAdjust",
                                                         &NLEVignetteAdjustEffect::create);

}  // namespace
