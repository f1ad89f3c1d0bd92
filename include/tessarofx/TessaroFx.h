// The plug-in's entry points. A host loads libTessaroFx.so (dlopen), looks these three up by
// their unmangled names, and does everything else through the interfaces they return.
//
//   1. GetFilterCount() once, from one thread, before anything else: it builds the list of
//      published filters (ten, in ascending GUID order).
//   2. GetFilterProperties(i, &desc) for i below the count: the descriptor bag of filter i
//      (NLEKey::Filter::kFilterID, kFilterFriendName, kFilterCSupport, kFilterOpenclSupport and,
//      for filters that register them, the parameter descriptors under kParamsArray[i]).
//   3. CreateFilterFromGUID(device, guid, props, programPath, &filter): the OpenCL class when a
//      device is passed (programPath names the directory of the OpenCL kernel sources), else the
//      CPU class. `props` carries the host's settings, parameters among them; the returned
//      filter holds its own copies.
//
// Threading: after step 1, different filter objects may run on different threads at the same
// time; one filter object must be called by one thread at a time.
// Frames: 8-bit BGRA (byte 0 blue, 1 green, 2 red, 3 alpha), see NLEFrame.h.
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
