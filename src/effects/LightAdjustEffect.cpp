// LightAdjust: highlights, shadows, white and black levels.
#include "plugin/NLEDynamicEffect.h"

namespace {

// The pixel work of this effect is not part of this build: Transform keeps the base answer
// (not implemented), so hosts see a clean failure rather than an unchanged frame.
class NLELightAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLELightAdjustEffect(); }
};

const NLELightAdjustEffect::_auto_register s_register(L"D8651B53-F47A-4B98-B8E9-35B491D5EADC",
                                                      L"LightAdjust",
                                                      &NLELightAdjustEffect::create);

}  // namespace
