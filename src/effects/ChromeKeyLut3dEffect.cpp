// ChromeKeyLut3d: green- and blue-screen keying through generated 3D LUTs.
#include "plugin/NLEDynamicEffect.h"

namespace {

// Key colour, edge contrast and offset, and the output mode.
void RegisterParams(NLEFilterInfoComPtr& d) {
  const auto kInt = NLEFilterPropertyType_Int;
  const auto kDouble = NLEFilterPropertyType_Double;
  d.AddParam<int>(L"red", kInt, 0, 0, 255, 1, L"red", 0);
  d.AddParam<int>(L"green", kInt, 0, 0, 255, 1, L"green", 0);
  d.AddParam<int>(L"blue", kInt, 0, 0, 255, 1, L"blue", 0);
  d.AddParam<double>(L"contrast", kDouble, 50.0, 0.0, 100.0, 1.0, L"contrast", 0);
  d.AddParam<double>(L"offset", kDouble, 0.0, -100.0, 100.0, 0.1, L"offset", 0);
  d.AddParam<int>(L"mode", kInt, 0, 0, 1, 1, L"mode", 0);
}

// The pixel work of this effect is not part of this build: Transform keeps the base answer
// (not implemented), so hosts see a clean failure rather than an unchanged frame.
class NLEChromeKeyLut3dEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEChromeKeyLut3dEffect(); }
};

const NLEChromeKeyLut3dEffect::_auto_register s_register(L"DB4BBA18-48FC-4164-B572-E59757B02796",
                                                         L"ChromeKeyLut3d",
                                                         &NLEChromeKeyLut3dEffect::create,
                                                         &RegisterParams);

}  // namespace
