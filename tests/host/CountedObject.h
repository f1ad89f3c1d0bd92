// An IUnknown that only counts references, so tests can see exactly how many the code under test
// holds. It lives on the test's stack and is never deleted through Release.
#pragma once

#include "tessarofx/NLEComBase.h"

class CountedObject : public IUnknown {
 public:
  virtual ~CountedObject() = default;
  HRESULT QueryInterface(REFIID iid, void** out) override {
    if (!out) return NLE_E_POINTER;
    *out = iid == IID_IUnknown ? this : nullptr;
    return *out ? (AddRef(), NLE_S_OK) : NLE_E_NOINTERFACE;
  }
  uint32_t AddRef() override { return ++refs; }
  uint32_t Release() override { return --refs; }

  uint32_t refs = 0;
};
