#include "plugin/NLEFilterInfoComPtr.h"

#include "tessarofx/NLEHost.h"

namespace Key = NLEKey::Filter::Property;

template <class T>
int NLEFilterInfoComPtr::AddParam(const wchar_t* name, enumNLEFilterPropertyType type, T def, T min,
                                  T max, T step, const wchar_t* friendName, int displayType) {
  NLEComPtr<INLEProperties> param;
  NLECommon::GetInterface(CLSID_NLEProperties, nullptr, 0, IID_INLEProperties,
                          reinterpret_cast<void**>(&param));
  CNLEValue vDef, vMin, vMax, vStep;
  vDef.Set<T>(def);
  vMin.Set<T>(min);
  vMax.Set<T>(max);
  vStep.Set<T>(step);  // converted for symmetry; no step key is published

  NLEFilterInfoComPtr p(param);
  p->SetInt(Key::kDisplayType, displayType);
  p->SetString(Key::kFriendName, friendName);
  p->SetString(Key::kVariantName, name);
  p->SetInt(Key::kType, type);
  if (p->SetValue(Key::kValue_Min, vMin) >= 0) p->SetValue(Key::kValue_Max, vMax);
  p->SetValue(Key::kValue_Default, vDef);
  p->SetValue(Key::kValue_Current, vDef);

  int32_t count = 0;
  if ((*this)->GetInt(Key::kCount, &count) < 0) count = 0;
  if (count >= 0 && count < Key::kMaxParams) {
    (*this)->SetInterface(Key::kParamsArray[count], param.get());
    (*this)->SetInt(Key::kCount, count + 1);
  }
  return 0;
}

template int NLEFilterInfoComPtr::AddParam<double>(const wchar_t*, enumNLEFilterPropertyType,
                                                   double, double, double, double, const wchar_t*,
                                                   int);
template int NLEFilterInfoComPtr::AddParam<int>(const wchar_t*, enumNLEFilterPropertyType, int, int,
                                                int, int, const wchar_t*, int);

NLEComPtr<INLEProperties> NLEFilterInfoComPtr::GetParam(int i) const {
  NLEComPtr<INLEProperties> result;
  if (i < 0 || i >= Key::kMaxParams) return result;
  NLEComPtr<IUnknown> unk;
  if ((*this)->GetInterface(Key::kParamsArray[i], &unk) >= 0 && unk) {
    unk.QueryInterface(IID_INLEProperties, &result);
  }
  return result;
}
