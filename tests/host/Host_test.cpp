#include <gtest/gtest.h>

#include "host/CountedObject.h"
#include "tessarofx/NLECGFilter.h"
#include "tessarofx/NLEHost.h"

namespace {

// An outer object that aggregates one host object, as a host extending a bag or a frame would.
struct Outer final : CountedObject {
  HRESULT Aggregate(REFCLSID clsid) {
    return NLECommon::GetInterface(clsid, this, 0, IID_IUnknown, reinterpret_cast<void**>(&inner));
  }
  HRESULT QueryInterface(REFIID iid, void** out) override {
    if (iid == IID_IUnknown) return CountedObject::QueryInterface(iid, out);
    return inner->QueryInterface(iid, out);
  }
  NLEComPtr<IUnknown> inner;
};

TEST(HostAggregation, InnerInterfacesShareTheOuterIdentityAndCount) {
  const struct {
    const char* name;
    const CLSID* clsid;
    const IID* iid;
  } classes[] = {{"properties", &CLSID_NLEProperties, &IID_INLEProperties},
                 {"memory frame", &CLSID_NLEMemoryFrame, &IID_INLEFrame},
                 {"environment", &CLSID_NLEEnviroment, &IID_INLEEnviroment}};
  for (const auto& c : classes) {
    SCOPED_TRACE(c.name);
    Outer outer;
    ASSERT_EQ(outer.Aggregate(*c.clsid), NLE_S_OK);
    EXPECT_EQ(outer.refs, 0u) << "the inner object must not count its owner";

    IUnknown* iface = nullptr;
    ASSERT_EQ(outer.QueryInterface(*c.iid, reinterpret_cast<void**>(&iface)), NLE_S_OK);
    EXPECT_EQ(outer.refs, 1u);
    IUnknown* identity = nullptr;
    ASSERT_EQ(iface->QueryInterface(IID_IUnknown, reinterpret_cast<void**>(&identity)), NLE_S_OK);
    EXPECT_EQ(identity, &outer);
    EXPECT_EQ(outer.refs, 2u);
    identity->Release();
    iface->Release();
    EXPECT_EQ(outer.refs, 0u);
    // The outer object's reference is the inner object's only one.
    EXPECT_EQ(outer.inner->AddRef(), 2u);
    EXPECT_EQ(outer.inner->Release(), 1u);
  }
}

TEST(HostFactory, RejectsUnknownClassesInterfacesNullOutputsAndOuterNotAskingForIUnknown) {
  Outer outer;
  void* out = &out;
  EXPECT_EQ(NLECommon::GetInterface(IID_INLEFrame, nullptr, 0, IID_IUnknown, &out),
            NLE_E_CLASSNOTREG);
  EXPECT_EQ(out, nullptr);
  EXPECT_EQ(NLECommon::GetInterface(CLSID_NLEProperties, nullptr, 0, IID_INLEFrame, &out),
            NLE_E_NOINTERFACE);
  out = &out;
  EXPECT_EQ(NLECommon::GetInterface(CLSID_NLEProperties, &outer, 0, IID_INLEProperties, &out),
            NLE_E_INVALIDARG);
  EXPECT_EQ(out, nullptr);
  EXPECT_EQ(NLECommon::GetInterface(CLSID_NLEProperties, nullptr, 0, IID_IUnknown, nullptr),
            NLE_E_POINTER);
  EXPECT_EQ(NLECommon::CreateProperties(nullptr), NLE_E_POINTER);
}

}  // namespace
