// HSLAdjust: per-colour hue, saturation and lightness in eight bands.
#include "plugin/NLEDynamicEffect.h"

namespace {

// The pixel work of this effect is not part of this build: Transform keeps the base answer
// (not implemented), so hosts see a clean failure rather than an unchanged frame.
class NLEHSLAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEHSLAdjustEffect(); }
};

const NLEHSLAdjustEffect::_auto_register s_register(L"AF91FF05-6577-4A4B-C81E-652EE7D6596E",
                                                    L"HSLAdjust", &NLEHSLAdjustEffect::create);

}  // namespace
