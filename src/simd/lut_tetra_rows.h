// The vector form of the tetrahedral LUT row, compiled once per instruction set and picked at run
// time. It gives the bytes of TetraRowReference (lut/CubeLutApply.cpp) for every input, hostile
// lattices included.
#pragma once

#include <cstdint>

namespace tfx {

struct TetraTable;

// TetraRow's contract, on the instruction set Highway's dispatch picks at the time of the call
// (hwy::SetSupportedTargetsForTest included). Any bytesPerPixel of 3 or more; 4 is the fast one.
void TetraRowVector(const TetraTable& table, uint8_t* row, int width, int bytesPerPixel);

// The name of the instruction set TetraRowVector would run now.
const char* TetraRowVectorTarget();

}  // namespace tfx
