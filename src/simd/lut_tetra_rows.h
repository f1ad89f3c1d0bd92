// The vector form of the tetrahedral LUT row, compiled once per instruction set and picked at run
// time. It gives the bytes of TetraRowReference (lut/CubeLutApply.cpp) for every input, hostile
// lattices included.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tfx {

class TetraPlan;

// TetraRow's contract for a packed plan, on the instruction set Highway's dispatch picks at the
// time of the call (hwy::SetSupportedTargetsForTest included). Any bytesPerPixel of 3 or more; 4
// is the fast one.
void TetraRowVector(const TetraPlan& plan, const uint8_t* in, uint8_t* out, int width,
                    int bytesPerPixel);

// The vector width, in bytes, of the instruction sets that sort a band into slabs (AVX-512).
inline constexpr size_t kSortBytes = 64;

// The uint32_t elements one slab of a band of `rows` rows of `width` pixels may need.
size_t TetraBandCapacity(int width, int rows);
// The uint32_t elements of scratch TetraBandsVector needs for bands of `rows` rows of `width`
// pixels: every slab, and where each vector's pixels went, for two bands.
size_t TetraBandScratch(int width, int rows);

// `rows` rows of 4-byte pixels (4-byte aligned, pitches in bytes) through a plan with Slabs() > 1
// in bands of `bandRows` rows (the last may have fewer), a slab at a time with AVX-512 and row by
// row on the other instruction sets; `scratch` holds TetraBandScratch(width, bandRows) elements.
void TetraBandsVector(const TetraPlan& plan, const uint8_t* in, ptrdiff_t inPitch, uint8_t* out,
                      ptrdiff_t pitch, int width, int rows, int bandRows, uint32_t* scratch);

// The floats a colour point takes in a packed lattice on the instruction set Highway's dispatch
// picks now: 4, aligned blocks of red, green, blue and 0, where the rows sort bands into slabs
// (AVX-512); 3 elsewhere, a quarter less cache for the same lattice (AMD's Zen 3, whose
// second-level cache a 33-point lattice outgrows, took a quarter longer with 4).
int TetraPointFloats();

// The name of the instruction set TetraRowVector would run now.
const char* TetraRowVectorTarget();

}  // namespace tfx
