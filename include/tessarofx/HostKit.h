// The host kit, everything a host needs around the plug-in: the component model and counted
// pointers, property bags, CPU memory frames, the environment service, the logger, and the
// OpenCL device, programs, memory and device frames. The filter interface the plug-in hands out
// is here too, so that a host drives filters with this header and TessaroFx.h alone.
//
// Link libTessaroFxHost (CMake: TessaroFx::Host; pkg-config: tessarofx). The plug-in itself is
// not linked: it is loaded at run time, see TessaroFx.h.
#pragma once

#include "tessarofx/NLECGFilter.h"
#include "tessarofx/NLEComBase.h"
#include "tessarofx/NLEFrame.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/NLEOpenCL.h"
#include "tessarofx/NLEProperties.h"
