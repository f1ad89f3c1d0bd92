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

// A descriptor with the given double parameters (name, default, current).
struct ParamDesc {
  const wchar_t* name;
  double def;
  double current;
};
NLEComPtr<INLEProperties> DescriptorWith(std::initializer_list<ParamDesc> params) {
  NLEComPtr<INLEProperties> desc;
  NLECommon::CreateProperties(&desc);
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

// The times and regions reach the kernels through the parameter block, which the cross-filter
// tests read back.
TEST(NLEBasicFilter, StoresClipStateAsHostsExpect) {
  NLEComPtr<ProbeFilter> f(new ProbeFilter);
  for (const int t : {0, -5}) {
    f->SetTotalTime(t);
    EXPECT_EQ(f->TotalTime(), 1) << t;  // a divisor
  }
  NLERectF roi{}, inner{};
  ASSERT_EQ(f->GetRegionOfInterest(&roi, &inner), NLE_S_OK);
  EXPECT_EQ(roi.width, 1.0);
  EXPECT_EQ(inner.height, 1.0);
  EXPECT_EQ(roi.x + roi.y + inner.x + inner.y, 0.0);
  EXPECT_EQ(f->GetRegionOfInterest(&roi, nullptr), NLE_E_INVALIDARG);
  EXPECT_EQ(f->GetRegionOfInterest(nullptr, &inner), NLE_E_INVALIDARG);

  NLERect rod{5, 6, 7, 8};
  EXPECT_EQ(f->CalcROD(NLESize{1, 1}, rod), NLE_S_OK);
  EXPECT_EQ(rod.x + rod.y, 0);
  EXPECT_EQ(rod.width, 7);
  EXPECT_EQ(f->Update(nullptr, nullptr, nullptr), NLE_E_NOTIMPL);
}

TEST(NLEBasicFilter, ReportsPassthroughOnlyWhenAskedAndAtDefaults) {
  NLEComPtr<ProbeFilter> f(new ProbeFilter);
  f->CopyFromFilterProperty(DescriptorWith({{L"a", 1.0, 1.0}, {L"b", 0.0, 0.0}}));
  f->ParamValueChanged();
  EXPECT_FALSE(f->IsPassthrough());  // "Filter.IgnoreDef" not set

  NLEComPtr<INLEProperties> own, a, b;
  ASSERT_EQ(f->QueryInterface(IID_INLEProperties, reinterpret_cast<void**>(&own)), NLE_S_OK);
  own->SetInt(Key::kIgnoreDef, 1);
  f->ParamValueChanged();
  EXPECT_TRUE(f->IsPassthrough());

  ASSERT_EQ(f->GetParamPropertyFromName(L"b", &b), NLE_S_OK);
  b->SetValue(Key::Property::kValue_Current, CNLEValue(0.5));
  f->ParamValueChanged();
  EXPECT_FALSE(f->IsPassthrough());

  // An int 1 is not the double 1.0: values compare by type and text.
  b->SetValue(Key::Property::kValue_Current, CNLEValue(0.0));
  ASSERT_EQ(f->GetParamPropertyFromName(L"a", &a), NLE_S_OK);
  a->SetValue(Key::Property::kValue_Current, CNLEValue(1));
  f->ParamValueChanged();
  EXPECT_FALSE(f->IsPassthrough());

  NLEComPtr<ProbeFilter> bare(new ProbeFilter);
  NLEComPtr<INLEProperties> settings;
  NLECommon::CreateProperties(&settings);
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

  // Shared friend names hide the last parameters from indexing; the later one wins the name.
  NLEComPtr<ProbeFilter> shared(new ProbeFilter);
  shared->CopyFromFilterProperty(DescriptorWith({{L"same", 0, 0}, {L"same", 1, 1}}));
  EXPECT_EQ(shared->GetParamCount(), 1);
  NLEComPtr<INLEProperties> p;
  EXPECT_EQ(shared->GetParamProperty(1, &p), NLE_E_INVALIDARG);
  ASSERT_EQ(shared->GetParamPropertyFromName(L"same", &p), NLE_S_OK);
  p->GetValue(Key::Property::kValue_Default, &current);
  EXPECT_EQ(current.Text(), L"1.000000");
}

// Registered double parameters are the tool's list test's business; ints and the step are not.
TEST(NLEFilterInfoComPtr, AddsParametersUnderConsecutiveKeys) {
  NLEComPtr<INLEProperties> desc;
  NLECommon::CreateProperties(&desc);
  NLEFilterInfoComPtr info(desc);
  EXPECT_EQ(info.AddParam<int>(L"n", NLEFilterPropertyType_Int, 3, 0, 9, 1, L"N", 0), 0);
  int32_t count = 0;
  desc->GetInt(Key::Property::kCount, &count);
  EXPECT_EQ(count, 1);
  NLEComPtr<INLEProperties> p = info.GetParam(0);
  ASSERT_TRUE(p);
  CNLEValue max;
  p->GetValue(Key::Property::kValue_Max, &max);
  EXPECT_EQ(max, CNLEValue(9));
  EXPECT_EQ(p->GetKind(L"Property.Value.Step"), kNLEPropNone);  // hosts get no step
  EXPECT_FALSE(info.GetParam(1));
  EXPECT_FALSE(info.GetParam(-1));
}

TEST(NLEFilterInfoComPtrDeathTest, NullDescriptorStopsTheProcess) {
  NLEFilterInfoComPtr empty;
  EXPECT_DEATH(empty->SetInt(L"k", 1), "p != NULL");
}

}  // namespace
