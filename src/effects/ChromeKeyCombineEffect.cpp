// ChromeKeyCombine: combines a keyed foreground with its mask.
#include "plugin/NLEDynamicEffect.h"

namespace {

// The pixel work of this effect is not part of this build: Transform keeps the base answer
// (not implemented), so hosts see a clean failure rather than an unchanged frame.
class NLEChromeKeyCombineEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEChromeKeyCombineEffect(); }
};

const NLEChromeKeyCombineEffect::_auto_register s_register(L"41AA934B-757A-4EAD-8F7B-85E2E2952B6A",
                                                           L"ChromeKeyCombine",
                                                           &NLEChromeKeyCombineEffect::create);

}  // namespace
