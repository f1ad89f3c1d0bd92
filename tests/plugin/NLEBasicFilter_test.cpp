#include "plugin/NLEBasicFilter.h"

#include <gtest/gtest.h>

#include "plugin/NLEFilterInfoComPtr.h"
#include "tessarofx/NLEHost.h"

namespace {

namespace Key = NLEKey::Filter;

class ProbeFilter final : public NLEBasicFilter {
 public:
  using NLEBasicFilter::TotalTime;
};

NLEComPtr<INLEProperties> NewBag() {
  NLEComPtr<INLEProperties> bag;
  NLECommon::CreateProperties(&bag);
  return bag;
}

// A descriptor with the given double parameters (name, default, current).
struct ParamDesc {
  const wchar_t* name;
  double def;
  double current;
};
NLEComPtr<INLEProperties> DescriptorWith(std::initializer_list<ParamDesc> params) {
  NLEComPtr<INLEProperties> desc = NewBag();
  NLEFilterInfoComPtr info(desc);
  int i = 0;
  for (const ParamDesc& p : params) {
    info.AddParam<double>(p.name, NLEFilterPropertyType_Double, p.def, -10, 10, 1, p.name, 0);
    info.GetParam(i++)->SetValue(Key::Property::kValue_Current, CNLEValue(p.current));
  }
  desc->SetString(Key::kFilterID, L"12345678-ABCD-ABCD-ABCD-1234567890AB-and-more-text");
  desc->SetString(Key::kFilterFriendName, L"Probe");
  return desc;
}

TEST(NLEBasicFilter, StoresClipStateAsHostsExpect) {
  NLEComPtr<ProbeFilter> f(new ProbeFilter);
  f->SetTotalTime(0);
  EXPECT_EQ(f->TotalTime(), 1);
  f->SetTotalTime(-5);
  EXPECT_EQ(f->TotalTime(), 1);
  f->SetTotalTime(250);
  EXPECT_EQ(f->TotalTime(), 250);

  for (int pass = 0; pass < 2; ++pass) {
    NLERectF roi{}, inner{};
    ASSERT_EQ(f->GetRegionOfInterest(&roi, &inner), NLE_S_OK);
    EXPECT_EQ(roi.width, 1.0);
    EXPECT_EQ(inner.height, 1.0);
    EXPECT_EQ(roi.x + roi.y + inner.x + inner.y, 0.0);
  }
  NLERectF r{};
  EXPECT_EQ(f->GetRegionOfInterest(&r, nullptr), NLE_E_INVALIDARG);
  EXPECT_EQ(f->GetRegionOfInterest(nullptr, &r), NLE_E_INVALIDARG);

  f->SetAngle(0.1);
  double angle = 0;
  f->GetAngle(&angle);
  EXPECT_EQ(angle, static_cast<double>(0.1f));  // stored as a float

  NLERect rod{5, 6, 7, 8};
  EXPECT_EQ(f->CalcROD(NLESize{1, 1}, rod), NLE_S_OK);
  EXPECT_EQ(rod.x, 0);
  EXPECT_EQ(rod.y, 0);
  EXPECT_EQ(rod.width, 7);
  EXPECT_EQ(f->Update(nullptr, nullptr, nullptr), NLE_E_NOTIMPL);
}

TEST(NLEBasicFilter, ReportsPassthroughOnlyWhenAskedAndAtDefaults) {
  NLEComPtr<ProbeFilter> f(new ProbeFilter);
  f->CopyFromFilterProperty(DescriptorWith({{L"a", 1.0, 1.0}, {L"b", 0.0, 0.0}}));
  f->ParamValueChanged();
  EXPECT_FALSE(f->IsPassthrough());  // "Filter.IgnoreDef" not set

  NLEComPtr<INLEProperties> own;
  ASSERT_EQ(f->QueryInterface(IID_INLEProperties, reinterpret_cast<void**>(&own)), NLE_S_OK);
  own->SetInt(Key::kIgnoreDef, 1);
  f->ParamValueChanged();
  EXPECT_TRUE(f->IsPassthrough());

  NLEComPtr<INLEProperties> b;
  ASSERT_EQ(f->GetParamPropertyFromName(L"b", &b), NLE_S_OK);
  b->SetValue(Key::Property::kValue_Current, CNLEValue(0.5));
  f->ParamValueChanged();
  EXPECT_FALSE(f->IsPassthrough());

  // An int 1 is not the double 1.0: values compare by type and text.
  b->SetValue(Key::Property::kValue_Current, CNLEValue(0.0));
  NLEComPtr<INLEProperties> a;
  f->GetParamPropertyFromName(L"a", &a);
  a->SetValue(Key::Property::kValue_Current, CNLEValue(1));
  f->ParamValueChanged();
  EXPECT_FALSE(f->IsPassthrough());

  NLEComPtr<ProbeFilter> bare(new ProbeFilter);
  NLEComPtr<INLEProperties> settings = NewBag();
  settings->SetInt(Key::kIgnoreDef, 1);
  bare->CopyFromFilterProperty(settings);
  bare->ParamValueChanged();
  EXPECT_TRUE(bare->IsPassthrough());
}

TEST(NLEBasicFilter, CopiesParametersDeeplyAndIndexesThemByFriendName) {
  NLEComPtr<INLEProperties> desc = DescriptorWith({{L"x", 2.0, 3.0}, {L"y", 0.0, 0.0}});
  NLEComPtr<ProbeFilter> f(new ProbeFilter);
  f->CopyFromFilterProperty(desc);
  f->CopyFromFilterProperty(nullptr);  // ignored

  // GUID and name are read through a 38-character buffer.
  NLEComPtr<INLEProperties> own;
  f->QueryInterface(IID_INLEProperties, reinterpret_cast<void**>(&own));
  EXPECT_EQ(f->Guid(), L"12345678-ABCD-ABCD-ABCD-1234567890AB-");
  EXPECT_EQ(f->FriendName(), L"Probe");

  EXPECT_EQ(f->GetParamCount(), 2);
  NLEComPtr<INLEProperties> x;
  ASSERT_EQ(f->GetParamProperty(0, &x), NLE_S_OK);
  NLEFilterInfoComPtr info(desc);
  EXPECT_NE(x.get(), info.GetParam(0).get());
  CNLEValue current;
  x->GetValue(Key::Property::kValue_Current, &current);
  EXPECT_EQ(current.Text(), L"3.000000");

  // Writing the filter's copy leaves the descriptor alone.
  x->SetValue(Key::Property::kValue_Current, CNLEValue(9.0));
  info.GetParam(0)->GetValue(Key::Property::kValue_Current, &current);
  EXPECT_EQ(current.Text(), L"3.000000");

  NLEComPtr<INLEProperties> none;
  EXPECT_EQ(f->GetParamProperty(2, &none), NLE_E_INVALIDARG);
  EXPECT_EQ(f->GetParamProperty(-1, &none), NLE_E_INVALIDARG);
  EXPECT_EQ(f->GetParamPropertyFromName(L"z", &none), NLE_E_INVALIDARG);

  // Shared friend names hide the last parameters from indexing.
  NLEComPtr<ProbeFilter> shared(new ProbeFilter);
  shared->CopyFromFilterProperty(DescriptorWith({{L"same", 0, 0}, {L"same", 1, 1}}));
  EXPECT_EQ(shared->GetParamCount(), 1);
  NLEComPtr<INLEProperties> p;
  EXPECT_EQ(shared->GetParamProperty(1, &p), NLE_E_INVALIDARG);
  ASSERT_EQ(shared->GetParamPropertyFromName(L"same", &p), NLE_S_OK);
  CNLEValue def;
  p->GetValue(Key::Property::kValue_Default, &def);
  EXPECT_EQ(def.Text(), L"1.000000");  // the later parameter wins the name
}

TEST(NLEFilterInfoComPtr, AddsParametersUnderConsecutiveKeys) {
  NLEComPtr<INLEProperties> desc = NewBag();
  NLEFilterInfoComPtr info(desc);
  EXPECT_EQ(info.AddParam<int>(L"n", NLEFilterPropertyType_Int, 3, 0, 9, 1, L"N", 0), 0);
  int32_t count = 0;
  desc->GetInt(Key::Property::kCount, &count);
  EXPECT_EQ(count, 1);
  NLEComPtr<INLEProperties> p = info.GetParam(0);
  ASSERT_TRUE(p);
  CNLEValue max;
  p->GetValue(Key::Property::kValue_Max, &max);
  EXPECT_EQ(max.TypeName(), L"int");
  EXPECT_EQ(max.Text(), L"9");
  EXPECT_EQ(p->GetKind(L"Property.Value.Step"), kNLEPropNone);  // hosts get no step
  EXPECT_FALSE(info.GetParam(1));
  EXPECT_FALSE(info.GetParam(-1));
}

TEST(NLEFilterInfoComPtrDeathTest, NullDescriptorStopsTheProcess) {
  NLEFilterInfoComPtr empty;
  EXPECT_DEATH(empty->SetInt(L"k", 1), "p != NULL");
}

}  // namespace
