// The component object behind every filter: interface answers, the filter's own property bag with
// its parameters, and the per-clip state a host pushes in.
#pragma once

#include <map>
#include <string>
#include <vector>

#include "catalog/FilterCatalog.h"
#include "tessarofx/NLECGFilter.h"
#include "tessarofx/NLEComBase.h"
#include "tessarofx/NLEProperties.h"

class NLEBasicFilter : public scombase::CUnknown, public INLECGFilter {
 public:
  explicit NLEBasicFilter(IUnknown* outer = nullptr);

  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override;
  ~NLEBasicFilter() override;

  NLE_DECLARE_IUNKNOWN

  HRESULT SetBackground(INLEFrame* frame) override;
  HRESULT SetForeground(INLEFrame* frame) override;
  HRESULT SetTotalTime(int32_t t) override;
  HRESULT SetCurrentTime(int32_t t) override;
  HRESULT SetFramerate(NLERational& rate) override;
  HRESULT SetRegionOfIntrest(const NLERectF& roi, const NLERectF& inner) override;
  HRESULT GetRegionOfInterest(NLERectF* roi, NLERectF* inner) override;
  HRESULT Prepare(CGFilterParam param) override;
  HRESULT Running(INLEFrame* dst) override;
  HRESULT Update(INLEFrame* dst, INLEProperties* in, INLEProperties* out) override;
  HRESULT CalcROD(NLESize size, NLERect& rod) override;
  int32_t GetParamCount() override;
  HRESULT GetParamProperty(int32_t index, INLEProperties** param) override;
  HRESULT GetParamPropertyFromName(const wchar_t* name, INLEProperties** param) override;
  HRESULT ParamValueChanged() override;
  bool IsPassthrough() override;
  HRESULT SetAngle(double angle) override;
  HRESULT GetAngle(double* angle) override;

  // Takes a descriptor or a host's settings: parameters become deep copies owned by the filter,
  // other entries overwrite the filter's own; then the name, GUID and parameter index are read
  // back from the own bag.
  void CopyFromFilterProperty(INLEProperties* src);

  const std::wstring& FriendName() const { return friendName_; }
  const std::wstring& Guid() const { return guid_; }

 protected:
  // Current value of the parameter with this friendly name, or `fallback` when the filter has no
  // such parameter or its value is not a number.
  double ParamDouble(const wchar_t* name, double fallback = 0.0) const;
  // An integer parameter, which arrives as a number; absent, non-numeric or outside int32: 0.
  int ParamInt(const wchar_t* name) const;
  // Current value of a text parameter, at most kMaxParamText wide characters, or `fallback` when
  // the filter has no such parameter.
  static constexpr size_t kMaxParamText = 512;
  std::wstring GetParamWString(const wchar_t* name, const std::wstring& fallback = {}) const;
  // The same for a catalogued parameter, whose default stands in for a value the host left out.
  double ParamDouble(const tfx::catalog::Param& p) const {
    return ParamDouble(p.wideName, p.defaultValue);
  }
  // Catalogued integers all default to 0, the value an absent one reads as.
  int ParamInt(const tfx::catalog::Param& p) const { return ParamInt(p.wideName); }
  std::wstring GetParamWString(const tfx::catalog::Param& p) const {
    return GetParamWString(p.wideName);
  }

  INLEFrame* Background() const { return background_; }
  INLEFrame* Foreground() const { return foreground_; }
  INLEProperties* OwnProperties() const { return props_.get(); }
  const NLERational& Framerate() const { return framerate_; }
  const NLERectF& RegionOfInterest() const { return roi_; }
  const NLERectF& InnerRegion() const { return innerRoi_; }
  int32_t TotalTime() const { return totalTime_; }
  int32_t CurrentTime() const { return currentTime_; }
  float Angle() const { return angle_; }

 private:
  void RebuildParamIndex();

  NLERational framerate_{25, 1};
  NLERectF roi_{0, 0, 1, 1};
  NLERectF innerRoi_{0, 0, 1, 1};
  int32_t totalTime_ = 0;
  int32_t currentTime_ = 0;
  std::wstring friendName_;
  std::wstring guid_;
  int32_t innerRoiSetting_ = 0;
  int32_t filterType_ = 0;
  INLEFrame* background_ = nullptr;
  INLEFrame* foreground_ = nullptr;
  NLEComPtr<INLEProperties> props_;
  std::map<std::wstring, NLEComPtr<INLEProperties>> paramIndex_;
  std::vector<NLEComPtr<INLEProperties>> paramList_;
  // Kept from the original object layout; no operation of this class reads them.
  int32_t reserved0_ = 16;
  int32_t reserved1_ = 16;
  float angle_ = 0.0f;
  bool passthrough_ = false;
};
