// Plain per-pixel versions of the light adjustments, written from the formulas alone and run
// through GetPixelColor/SetPixelColor, for the table paths to be compared against. They share no
// code with the library beyond CxImage.
#pragma once

#include "tessarofx/CxImage.h"

namespace tfx_test {

void ReferenceHighlight(CxImage* image, float h);
void ReferenceShadow(CxImage* image, float s);
void ReferenceWhiteLevel(CxImage* image, float w);
void ReferenceBlackLevel(CxImage* image, float k0);

}  // namespace tfx_test
