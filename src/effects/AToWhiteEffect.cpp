// lutAToWhiteEffect: turns a key's alpha into a white matte.
#include "plugin/NLEDynamicEffect.h"

namespace {

// The pixel work of this effect is not part of this build: Transform keeps the base answer
// (not implemented), so hosts see a clean failure rather than an unchanged frame.
class NLE3dlutAToWhiteEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLE3dlutAToWhiteEffect(); }
};

const NLE3dlutAToWhiteEffect::_auto_register s_register(L"969C6D5D-43AC-42F9-8F6C-9AB868BA9356",
                                                        L"lutAToWhiteEffect",
                                                        &NLE3dlutAToWhiteEffect::create);

}  // namespace
