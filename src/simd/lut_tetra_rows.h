// The vector form of the tetrahedral LUT row, compiled once per instruction set and picked at run
// time. It gives the bytes of TetraRowReference (lut/CubeLutApply.cpp) for every input, hostile
// lattices included.
#pragma once

#include <cstdint>

namespace tfx {

class TetraPlan;

// TetraRow's contract for a packed plan, on the instruction set Highway's dispatch picks at the
// time of the call (hwy::SetSupportedTargetsForTest included). Any bytesPerPixel of 3 or more; 4
// is the fast one.
void TetraRowVector(const TetraPlan& plan, const uint8_t* in, uint8_t* out, int width,
                    int bytesPerPixel);

// The name of the instruction set TetraRowVector would run now.
const char* TetraRowVectorTarget();

}  // namespace tfx
