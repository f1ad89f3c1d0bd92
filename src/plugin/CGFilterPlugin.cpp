// The plug-in's three entry points and the merged list of published filters.
#include <cstring>
#include <map>
#include <mutex>
#include <string>

#include "plugin/NLEBasicCrossFilter.h"
#include "plugin/NLEDynamicEffect.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

// Filters as the host sees them, by GUID: built by the first GetFilterCount. Where a GUID has
// both classes, the OpenCL class's descriptor is published and carries both support flags.
std::map<std::wstring, NLEComPtr<INLEProperties>> gAllProps;
// Several hosts may share one loaded plug-in (each frei0r module of the process is one), so the
// list is built under a lock; afterwards it never changes.
std::mutex gAllPropsMutex;

// The compiled-in source path after its last backslash, else after its last slash.
const wchar_t* SourceFileName() {
  static const std::wstring name = [] {
    const std::string path = __FILE__;
    size_t cut = path.find_last_of('\\');
    if (cut == std::string::npos) cut = path.find_last_of('/');
    const std::string base = cut == std::string::npos ? path : path.substr(cut + 1);
    return std::wstring(base.begin(), base.end());
  }();
  return name.c_str();
}

constexpr int kOpenCLCreationLine = 66;
constexpr int kCpuCreationLine = 78;

void LogCreation(const wchar_t* format, const NLEBasicFilter* filter, int line) {
  INLELogger* logger = NLEGetDefaultLogger();
  if (!logger || !logger->IsLevelEnabled(kNLELogInfo)) return;
  logger->Log(kNLELogInfo, format, filter->FriendName().c_str(), SourceFileName(), line);
}

// Holds a new filter for the duration of its creation, so that a failure can release it.
template <class T>
HRESULT HandOut(T* object, void** filter) {
  object->AddRef();
  const HRESULT hr = object->QueryInterface(IID_INLECGFilter, filter);
  object->Release();
  return hr;
}

}  // namespace

extern "C" {

// The OpenCL class when a device is passed, else the CPU class; the host's properties override
// the registered defaults. Creation is logged with this file's name and a line number; log
// readers match the numbers as published, so they are fixed rather than taken from the source.
// A new filter that cannot be bound to the device is released and reported as a bad argument.
// *filter receives the caller's reference.
HRESULT CreateFilterFromGUID(INLECGDevice* device, const wchar_t* guid, INLEProperties* props,
                             const char* programPath, void** filter) {
  if (!guid || !filter) return NLE_E_INVALIDARG;
  if (device) {
    NLEBasicCrossFilter* object = NLEBasicCrossFilter::create(guid);
    if (!object) return NLE_E_INVALIDARG;
    object->CopyFromFilterProperty(props);
    object->AddRef();
    if (object->InitFilter(device, std::string(programPath ? programPath : "")) < 0) {
      object->Release();
      return NLE_E_INVALIDARG;
    }
    LogCreation(L"CREATE <OPENCL> Filter: %ls  [%ls, %d]", object, kOpenCLCreationLine);
    const HRESULT hr = HandOut(object, filter);
    object->Release();
    return hr;
  }

  // CPU path: the program path means nothing here, and nothing needs binding. A GUID whose only
  // class is an OpenCL one has no CPU entry and so fails like an unknown GUID. The CPU class starts
  // holding the registered defaults; the host's settings then override them.
  NLEDynamicEffect* object = NLEDynamicEffect::create(guid);
  if (!object) return NLE_E_INVALIDARG;
  object->CopyFromFilterProperty(props);
  LogCreation(L"CREATE <PureC> Filter: %ls  [%ls, %d]", object, kCpuCreationLine);
  return HandOut(object, filter);
}

uint32_t GetFilterCount() {
  std::lock_guard<std::mutex> lock(gAllPropsMutex);
  if (!gAllProps.empty()) return static_cast<uint32_t>(gAllProps.size());
  const auto openclSet = NLEBasicCrossFilter::get_class_set();
  const auto cpuSet = NLEDynamicEffect::get_class_set();
  for (const auto& [guid, entry] : openclSet) {
    gAllProps[guid] = entry.second;
    if (entry.second) entry.second->SetInt(NLEKey::Filter::kFilterOpenclSupport, 1);
  }
  for (const auto& [guid, entry] : cpuSet) {
    auto it = gAllProps.find(guid);
    if (it != gAllProps.end()) {
      if (it->second) it->second->SetInt(NLEKey::Filter::kFilterCSupport, 1);
      continue;
    }
    gAllProps[guid] = entry.second;
    if (entry.second) entry.second->SetInt(NLEKey::Filter::kFilterCSupport, 1);
  }
  return static_cast<uint32_t>(gAllProps.size());
}

HRESULT GetFilterProperties(int index, INLEProperties** props) {
  std::lock_guard<std::mutex> lock(gAllPropsMutex);
  if (!props || gAllProps.empty() || index < 0) return NLE_E_INVALIDARG;
  auto it = gAllProps.begin();
  for (int i = 0; i < index && it != gAllProps.end(); ++i) ++it;
  if (it == gAllProps.end() || !it->second) return NLE_E_INVALIDARG;
  it->second->AddRef();
  *props = it->second.get();
  return NLE_S_OK;
}

}  // extern "C"
