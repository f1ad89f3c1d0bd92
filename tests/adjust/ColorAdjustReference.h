// Plain per-pixel versions of the colour adjustments, written from the formulas alone and run
// through GetPixelColor/SetPixelColor, for the fast paths to be compared against. They share no
// code with the library beyond CxImage.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <vector>

#include "tessarofx/CxImage.h"

namespace tfx_test {

void ReferenceExposure(CxImage* image, float e);
void ReferenceBrightness(CxImage* image, float b);
void ReferenceContrast(CxImage* image, float c);
void ReferenceVibrance(CxImage* image, float v);
void ReferenceSaturation(CxImage* image, float s);

// Equal buffers, or the first differing byte with its pixel coordinates.
::testing::AssertionResult SameBuffer(const CxImage& expected, const CxImage& actual);

// Deterministic pseudo-random bytes.
std::vector<uint8_t> NoiseBytes(size_t count, uint32_t salt);

}  // namespace tfx_test
