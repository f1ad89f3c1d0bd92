#include "lut/CubeLutApply.h"

#include "simd/lut_tetra_rows.h"

namespace tfx {
namespace {

constexpr int kStrideR = 64 * 64 * 3;  // lattice strides: red index outermost
constexpr int kStrideG = 64 * 3;
constexpr int kStrideB = 3;

}  // namespace

void TetraRowReference(const TetraTable& t, uint8_t* row, int width, int bytesPerPixel) {
  const int last = t.size - 1;
  for (int x = 0; x < width; ++x, row += bytesPerPixel) {
    const int b = row[0], g = row[1], r = row[2];
    const int ri = t.gt[r], gi = t.gt[g], bi = t.gt[b];
    const float fr = t.ft[r], fg = t.ft[g], fb = t.ft[b];
    const int rn = ri + 1 < last ? ri + 1 : last;
    const int gn = gi + 1 < last ? gi + 1 : last;
    const int bn = bi + 1 < last ? bi + 1 : last;
    float out[3];
    Tetrahedral(t.lattice + ri * kStrideR + gi * kStrideG + bi * kStrideB, (rn - ri) * kStrideR,
                (gn - gi) * kStrideG, (bn - bi) * kStrideB, fr, fg, fb, out);
    row[2] = LutComponentToByte(out[0]);
    row[1] = LutComponentToByte(out[1]);
    row[0] = LutComponentToByte(out[2]);
  }
}

void TetraRow(const TetraTable& table, uint8_t* row, int width, int bytesPerPixel) {
  // Highway picks the instruction set on every call, so a row costs one indirect call and the
  // choice follows hwy::SetSupportedTargetsForTest.
  TetraRowVector(table, row, width, bytesPerPixel);
}

}  // namespace tfx
