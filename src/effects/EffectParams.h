// Parameter lists that effect classes register in their descriptors.
#pragma once

#include "plugin/NLEFilterInfoComPtr.h"

// "u_temperature", "u_tint", "u_rgain", "u_ggain", "u_bgain": shared by the CPU and the OpenCL
// white-balance classes.
void RegisterWhiteBalanceParams(NLEFilterInfoComPtr& descriptor);
