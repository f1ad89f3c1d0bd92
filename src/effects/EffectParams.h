// Parameter lists that effect classes register in their descriptors.
#pragma once

#include "catalog/FilterCatalog.h"
#include "plugin/NLEFilterInfoComPtr.h"

// "u_temperature", "u_tint", "u_rgain", "u_ggain", "u_bgain": shared by the CPU and the OpenCL
// white-balance classes.
void RegisterWhiteBalanceParams(NLEFilterInfoComPtr& descriptor);

// Registers the filter's catalogued parameters in their catalogue order, each under its own name
// as friendly name, display type 0.
void RegisterCatalogParams(NLEFilterInfoComPtr& descriptor, const tfx::catalog::Filter& filter);
