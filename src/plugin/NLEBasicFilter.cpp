#include "plugin/NLEBasicFilter.h"

#include "plugin/NLEFilterInfoComPtr.h"
#include "tessarofx/NLEHost.h"

namespace {

namespace Key = NLEKey::Filter;

// Names and GUIDs are read through a fixed buffer, so longer texts are cut to 37 characters.
constexpr uint32_t kNameBuffer = 38;

std::wstring ReadShortString(INLEProperties* bag, const wchar_t* key) {
  wchar_t buf[kNameBuffer] = {};
  if (bag->GetString(key, buf, kNameBuffer, nullptr) < 0) return std::wstring();
  return std::wstring(buf);
}

}  // namespace

NLEBasicFilter::NLEBasicFilter(IUnknown* outer) : scombase::CUnknown(L"NLEBasicFilter", outer) {
  NLECommon::GetInterface(CLSID_NLEProperties, nullptr, 0, IID_INLEProperties,
                          reinterpret_cast<void**>(&props_));
  (void)reserved0_;
  (void)reserved1_;
}

NLEBasicFilter::~NLEBasicFilter() = default;

HRESULT NLEBasicFilter::NonDelegatingQueryInterface(REFIID iid, void** out) {
  if (!out) return NLE_E_POINTER;
  if (iid == IID_INLECGFilter) return GetInterface(static_cast<INLECGFilter*>(this), out);
  if (iid == IID_INLEProperties) {
    if (!props_) return NLE_E_NOINTERFACE;
    return GetInterface(props_.get(), out);
  }
  return scombase::CUnknown::NonDelegatingQueryInterface(iid, out);
}

HRESULT NLEBasicFilter::SetBackground(INLEFrame* frame) {
  background_ = frame;
  return NLE_S_OK;
}

HRESULT NLEBasicFilter::SetForeground(INLEFrame* frame) {
  foreground_ = frame;
  return NLE_S_OK;
}

HRESULT NLEBasicFilter::SetTotalTime(int32_t t) {
  totalTime_ = t > 0 ? t : 1;
  return NLE_S_OK;
}

HRESULT NLEBasicFilter::SetCurrentTime(int32_t t) {
  currentTime_ = t;
  return NLE_S_OK;
}

HRESULT NLEBasicFilter::SetFramerate(NLERational& rate) {
  framerate_ = rate;
  return NLE_S_OK;
}

HRESULT NLEBasicFilter::SetRegionOfIntrest(const NLERectF& roi, const NLERectF& inner) {
  roi_ = roi;
  innerRoi_ = inner;
  return NLE_S_OK;
}

HRESULT NLEBasicFilter::GetRegionOfInterest(NLERectF* roi, NLERectF* inner) {
  if (!roi || !inner) return NLE_E_INVALIDARG;
  *roi = roi_;
  *inner = innerRoi_;
  return NLE_S_OK;
}

HRESULT NLEBasicFilter::Prepare(CGFilterParam) { return NLE_S_OK; }

HRESULT NLEBasicFilter::Running(INLEFrame*) { return NLE_S_OK; }

HRESULT NLEBasicFilter::Update(INLEFrame*, INLEProperties*, INLEProperties*) {
  return NLE_E_NOTIMPL;
}

HRESULT NLEBasicFilter::CalcROD(NLESize, NLERect& rod) {
  rod.x = 0;
  rod.y = 0;
  return NLE_S_OK;
}

int32_t NLEBasicFilter::GetParamCount() { return static_cast<int32_t>(paramIndex_.size()); }

// Indexes the list while the count comes from the name index: parameters that share a friendly
// name make the list longer than the count, and its last entries are then unreachable here.
HRESULT NLEBasicFilter::GetParamProperty(int32_t index, INLEProperties** param) {
  if (index < 0 || index >= GetParamCount() || !paramList_[static_cast<size_t>(index)])
    return NLE_E_INVALIDARG;
  return paramList_[static_cast<size_t>(index)].QueryInterface(IID_INLEProperties, param);
}

HRESULT NLEBasicFilter::GetParamPropertyFromName(const wchar_t* name, INLEProperties** param) {
  if (!name) return NLE_E_INVALIDARG;
  auto it = paramIndex_.find(name);
  if (it == paramIndex_.end() || !it->second) return NLE_E_INVALIDARG;
  return it->second.QueryInterface(IID_INLEProperties, param);
}

HRESULT NLEBasicFilter::ParamValueChanged() {
  int32_t ignoreDefault = 0;
  if (!props_ || props_->GetInt(Key::kIgnoreDef, &ignoreDefault) < 0) ignoreDefault = 0;
  if (ignoreDefault == 0) return NLE_S_OK;

  passthrough_ = true;
  const int32_t count = GetParamCount();
  for (int32_t i = 0; i < count; ++i) {
    NLEComPtr<INLEProperties> param;
    if (GetParamProperty(i, &param) < 0 || !param) continue;
    CNLEValue current, def;
    param->GetValue(Key::Property::kValue_Current, &current);
    param->GetValue(Key::Property::kValue_Default, &def);
    if (!(current == def)) passthrough_ = false;
  }
  return NLE_S_OK;
}

bool NLEBasicFilter::IsPassthrough() { return passthrough_; }

HRESULT NLEBasicFilter::SetAngle(double angle) {
  angle_ = static_cast<float>(angle);
  return NLE_S_OK;
}

HRESULT NLEBasicFilter::GetAngle(double* angle) {
  if (!angle) return NLE_E_POINTER;
  *angle = angle_;
  return NLE_S_OK;
}

void NLEBasicFilter::CopyFromFilterProperty(INLEProperties* src) {
  if (!src || !props_) return;

  NLEComPtr<INLEProperties> tmp;
  if (NLECommon::CreateProperties(&tmp) < 0 || !tmp) return;
  src->CopyTo(tmp);

  // Parameters become fresh bags: the filter must never write into the caller's objects.
  NLEFilterInfoComPtr tmpInfo(tmp);
  int32_t count = 0;
  if (tmp->GetInt(Key::Property::kCount, &count) < 0) count = 0;
  for (int32_t i = 0; i < count && i < Key::Property::kMaxParams; ++i) {
    NLEComPtr<INLEProperties> copy;
    if (NLECommon::CreateProperties(&copy) < 0 || !copy) continue;
    NLEComPtr<INLEProperties> param = tmpInfo.GetParam(i);
    if (param) param->CopyTo(copy);
    props_->SetInterface(Key::Property::kParamsArray[i], copy.get());
    tmp->Remove(Key::Property::kParamsArray[i]);
  }
  tmp->CopyTo(props_);

  guid_ = ReadShortString(props_, Key::kFilterID);
  friendName_ = ReadShortString(props_, Key::kFilterFriendName);
  props_->GetInt(Key::kInnerROI, &innerRoiSetting_);
  props_->GetInt(Key::kFilterType, &filterType_);

  RebuildParamIndex();
}

void NLEBasicFilter::RebuildParamIndex() {
  paramIndex_.clear();
  paramList_.clear();
  NLEFilterInfoComPtr info(props_);
  int32_t count = 0;
  if (props_->GetInt(Key::Property::kCount, &count) < 0) count = 0;
  for (int32_t i = 0; i < count && i < Key::Property::kMaxParams; ++i) {
    NLEComPtr<INLEProperties> param = info.GetParam(i);
    std::wstring name;
    if (param) name = ReadShortString(param, Key::Property::kFriendName);
    paramIndex_[name] = param;
    paramList_.push_back(param);
  }
}

double NLEBasicFilter::ParamDouble(const wchar_t* name, double fallback) const {
  auto it = paramIndex_.find(name);
  if (it == paramIndex_.end() || !it->second) return fallback;
  INLEProperties* param = it->second.get();
  double v = 0;
  if (param->GetDouble(Key::Property::kValue_Current, &v) >= 0) return v;
  CNLEValue value;
  if (param->GetValue(Key::Property::kValue_Current, &value) >= 0 && value.GetDouble(&v)) return v;
  return fallback;
}

int NLEBasicFilter::ParamInt(const wchar_t* name) const {
  const double v = ParamDouble(name);
  if (!(v > -2147483648.0 && v < 2147483648.0)) return 0;
  return static_cast<int>(v);
}

std::wstring NLEBasicFilter::GetParamWString(const wchar_t* name,
                                             const std::wstring& fallback) const {
  auto it = paramIndex_.find(name);
  if (it == paramIndex_.end() || !it->second) return fallback;
  INLEProperties* param = it->second.get();
  std::wstring text(256, L'\0');
  uint32_t length = 0;
  if (param->GetString(Key::Property::kValue_Current, text.data(), 256, &length) < 0)
    return std::wstring();
  if (length >= 256) {
    text.assign(length + 1, L'\0');
    param->GetString(Key::Property::kValue_Current, text.data(), length + 1, &length);
  }
  text.resize(length < kMaxParamText ? length : kMaxParamText);
  return text;
}
