// The image functions the plug-in exports beside its entry points, for hosts that call them
// directly on a CxImage, a CubeLut or plain pixel buffers: colour, light, white-balance, hue, HSL,
// vignette and lens adjustments, 3D LUTs and the adjustments baked into them, and the enhancement
// library (blurs, denoisers, haze and detail filters, white-balance measures, compositing, aligned
// scratch memory). Each part's header states its pixel layout and its failure behaviour.
//
// Link libTessaroFx (CMake: TessaroFx::ImageFunctions; pkg-config: tessarofx-image). A host that
// also drives filters still loads them through the entry points of TessaroFx.h; the dynamic
// loader then shares the one copy of the library between both uses.
#pragma once

#include "tessarofx/AlignedMemory.h"
#include "tessarofx/Blur.h"
#include "tessarofx/ColorAdjust.h"
#include "tessarofx/Compositing.h"
#include "tessarofx/CubeLut.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/Denoise.h"
#include "tessarofx/DetailFilters.h"
#include "tessarofx/HSLAdjust.h"
#include "tessarofx/HueAdjust.h"
#include "tessarofx/LensAdjust.h"
#include "tessarofx/LightAdjust.h"
#include "tessarofx/Lut3dAdjust.h"
#include "tessarofx/Vignette.h"
#include "tessarofx/WhiteBalance.h"
#include "tessarofx/WhiteBalanceEstimate.h"
