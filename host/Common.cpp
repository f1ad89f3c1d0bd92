// The class factory: the one way plug-ins and hosts make the kit's objects.

#include "HostInternal.h"

namespace tfx::host {
namespace {

// The constructor behind a class identifier, or null for a class the kit does not know.
scombase::CUnknown* (*ConstructorOf(REFCLSID clsid))(IUnknown*) {
  if (clsid == CLSID_NLEProperties) return &NewPropertyBag;
  if (clsid == CLSID_NLEMemoryFrame) return &NewMemoryFrame;
  if (clsid == CLSID_NLEEnviroment) return &NewEnvironment;
  return nullptr;
}

}  // namespace
}  // namespace tfx::host

namespace NLECommon {

// `context` is reserved and ignored.
HRESULT GetInterface(REFCLSID clsid, IUnknown* outer, uint32_t /*context*/, REFIID iid,
                     void** out) {
  using namespace tfx::host;
  if (!out) return NLE_E_POINTER;
  *out = nullptr;
  const auto construct = ConstructorOf(clsid);
  if (!construct) return NLE_E_CLASSNOTREG;
  // An aggregated object is reached only through the outer object, which keeps the inner
  // object's own unknown; asking for anything else would split the object's identity.
  if (outer && iid != IID_IUnknown) return NLE_E_INVALIDARG;
  // The environment keeps no state, so everyone shares one; only an outer object that wants it
  // as part of itself gets a private one.
  if (clsid == CLSID_NLEEnviroment && !outer) return SharedEnvironment()->QueryInterface(iid, out);
  return CallGuarded([&] {
    scombase::CUnknown* object = construct(outer);
    // The temporary reference makes a failed query end the object instead of leaking it.
    object->NonDelegatingAddRef();
    const HRESULT hr = object->NonDelegatingQueryInterface(iid, out);
    object->NonDelegatingRelease();
    return hr;
  });
}

HRESULT CreateProperties(INLEProperties** out) {
  return GetInterface(CLSID_NLEProperties, nullptr, 0, IID_INLEProperties,
                      reinterpret_cast<void**>(out));
}

HRESULT CreateMemoryFrame(int32_t width, int32_t height, int32_t stride, INLEMemoryFrame** out) {
  if (!out) return NLE_E_POINTER;
  NLEComPtr<INLEMemoryFrame> frame;
  HRESULT hr = GetInterface(CLSID_NLEMemoryFrame, nullptr, 0, IID_INLEMemoryFrame,
                            reinterpret_cast<void**>(&frame));
  if (NLE_SUCCEEDED(hr)) hr = frame->Allocate(width, height, stride, kNLEFrameTopDown);
  *out = NLE_SUCCEEDED(hr) ? frame.Detach() : nullptr;
  return hr;
}

}  // namespace NLECommon
