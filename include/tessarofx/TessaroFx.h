// The plug-in's binary interface: three C entry points and the interfaces they hand out. A host
// reaches everything else (filters, their parameters, frames) through those interfaces.
//
// Loading. dlopen the plug-in by its SONAME file, libTessaroFx.so.0 (RTLD_NOW | RTLD_LOCAL is
// enough), and dlsym the three entry points below by their unmangled names; the PFN_ types at the
// end of this file are their pointer types. The plug-in needs the host kit, libTessaroFxHost.so.0:
// it finds the copy installed beside it, or shares the one a host already links (there is only
// ever one per process, so bags and frames made by either side are the same kind of object).
// Installed packages name the plug-in's path and its OpenCL kernel directory in their CMake
// package (TessaroFx_PLUGIN_FILE, TessaroFx_KERNEL_DIR) and pkg-config file (plugin,
// kerneldir). Keep the library loaded while anything it handed out is alive; hosts normally never
// unload it.
//
// Call order.
//   1. GetFilterCount() before anything else: the first call builds the list of published
//      filters (ten, in ascending GUID order); later calls, from any thread, return its length.
//   2. GetFilterProperties(i, &desc) for i below the count: the descriptor bag of filter i
//      (NLEKey::Filter::kFilterID, kFilterFriendName, kFilterCSupport, kFilterOpenclSupport and,
//      for filters that register them, the parameter descriptors under kParamsArray[i]).
//   3. CreateFilterFromGUID(device, guid, props, programPath, &filter): the OpenCL class when a
//      device is passed (programPath names the directory of the OpenCL kernel sources), else the
//      CPU class. `props` (may be null) carries the host's settings; the filter keeps copies.
//   4. Parameters are property bags, one per parameter, found by name: a bag holding the name
//      under NLEKey::Filter::Property::kFriendName (and kVariantName), the type under kType and
//      the value under kValue_Current. A host lists them in `props` at creation, under
//      kParamsArray[0..n-1] with n under kCount; that list replaces the one the class registered
//      (the descriptor's bags are the ones to copy and change), and a parameter left out takes
//      its default. Later, GetParamPropertyFromName gives the filter's own bag of a parameter:
//      set a new kValue_Current, then call ParamValueChanged.
//   5. Per frame: SetForeground with the input (and SetBackground for filters that combine
//      two), SetTotalTime, SetCurrentTime, Prepare and Running(dst). See NLECGFilter.h.
//
// Ownership. Every interface pointer that comes back through an out-parameter carries one
// reference, which the caller releases (Release, or an NLEComPtr that takes it over with Attach
// or operator&). Arguments are borrowed for the call, except the frames given to SetForeground
// and SetBackground, which the filter borrows until they are replaced or it is released: keep
// them alive until then. Descriptors from GetFilterProperties are shared by every filter of the
// class and are read, never written. An OpenCL filter holds a reference to its device's
// operations, so the device outlives it.
//
// Threading. After step 1, different filter objects may run on different threads at the same
// time; one filter object must be called by one thread at a time. Reference counts are atomic.
//
// Results. Calls answer an HRESULT (GetFilterCount, GetParamCount and IsPassthrough aside): 0
// (NLE_S_OK) or another non-negative code is success, a negative one failure (NLE_SUCCEEDED /
// NLE_FAILED; the codes and NLEResultText, which words them, are in NLEComBase.h).
// CreateFilterFromGUID answers NLE_E_INVALIDARG for a null guid or out-parameter, for a GUID with
// no class of the kind asked for, and for an OpenCL class that cannot be bound to the device or
// whose program is missing or does not build (the host kit's logger has the reason);
// GetFilterProperties answers it for an index out of range and before GetFilterCount.
//
// Frames. 8-bit BGRA (byte 0 blue, 1 green, 2 red, 3 alpha), rows `stride` bytes apart, top-down
// or bottom-up as the frame says; see NLEFrame.h. Hosts make CPU frames with the host kit
// (NLECommon::CreateMemoryFrame, which can wrap the host's own memory) and device frames with
// NLEOpenCL.h.
#pragma once

#include <cstdint>

#include "tessarofx/Export.h"
#include "tessarofx/NLECGFilter.h"
#include "tessarofx/NLEFrame.h"
#include "tessarofx/NLEProperties.h"

extern "C" {
TFX_API uint32_t GetFilterCount();
TFX_API HRESULT GetFilterProperties(int index, INLEProperties** props);
// *filter receives an INLECGFilter* (a reference the caller releases).
TFX_API HRESULT CreateFilterFromGUID(INLECGDevice* device, const wchar_t* guid,
                                     INLEProperties* props, const char* programPath, void** filter);

typedef uint32_t (*PFN_GetFilterCount)();
typedef HRESULT (*PFN_GetFilterProperties)(int, INLEProperties**);
typedef HRESULT (*PFN_CreateFilterFromGUID)(INLECGDevice*, const wchar_t*, INLEProperties*,
                                            const char*, void**);
}
