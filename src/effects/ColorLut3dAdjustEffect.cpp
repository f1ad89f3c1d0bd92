// ColorLut3dAdjust: a 3D LUT file named by "lut3dPath" applied to the frame.
#include "plugin/NLEDynamicEffect.h"

namespace {

// The pixel work of this effect is not part of this build: Transform keeps the base answer
// (not implemented), so hosts see a clean failure rather than an unchanged frame.
class NLEColorLut3dAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEColorLut3dAdjustEffect(); }
};

const NLEColorLut3dAdjustEffect::_auto_register s_register(L"74EB022D-1D73-4D1E-9F70-487C356D46CD",
                                                           L"ColorLut3dAdjust",
                                                           &NLEColorLut3dAdjustEffect::create);

}  // namespace
