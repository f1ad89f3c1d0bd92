// Plain per-pixel versions of the colour adjustments, written from the formulas alone and run
// through GetPixelColor/SetPixelColor, for the fast paths to be compared against. They share no
// code with the library beyond CxImage.
#pragma once

#include "support/ImageBuilders.h"

namespace tfx_test {

void ReferenceExposure(CxImage* image, float e);
void ReferenceBrightness(CxImage* image, float b);
void ReferenceContrast(CxImage* image, float c);
void ReferenceVibrance(CxImage* image, float v);
void ReferenceSaturation(CxImage* image, float s);

}  // namespace tfx_test
