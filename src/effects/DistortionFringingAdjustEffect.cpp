// DistortionFringingAdjust: lens distortion and colour fringing.
#include "plugin/NLEDynamicEffect.h"

namespace {

// The pixel work of this effect is not part of this build: Transform keeps the base answer
// (not implemented), so hosts see a clean failure rather than an unchanged frame.
class NLEDistortionFringingAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEDistortionFringingAdjustEffect(); }
};

const NLEDistortionFringingAdjustEffect::_auto_register s_register(
    L"CFAAD60B-AC2B-4B39-A8E1-D25E35A6F735", L"DistortionFringingAdjust",
    &NLEDistortionFringingAdjustEffect::create);

}  // namespace
