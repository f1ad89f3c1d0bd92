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
    const auto corner = [&](int i, int j, int k) {
      return t.lattice + i * kStrideR + j * kStrideG + k * kStrideB;
    };
    const float* c000 = corner(ri, gi, bi);
    const float* c111 = corner(rn, gn, bn);
    float out[3];
    for (int c = 0; c < 3; ++c) {
      if (fr > fg) {
        if (fg > fb) {
          out[c] = (1 - fr) * c000[c] + (fr - fg) * corner(rn, gi, bi)[c] +
                   (fg - fb) * corner(rn, gn, bi)[c] + fb * c111[c];
        } else if (fr > fb) {
          out[c] = (1 - fr) * c000[c] + (fr - fb) * corner(rn, gi, bi)[c] +
                   (fb - fg) * corner(rn, gi, bn)[c] + fg * c111[c];
        } else {
          out[c] = (1 - fb) * c000[c] + (fb - fr) * corner(ri, gi, bn)[c] +
                   (fr - fg) * corner(rn, gi, bn)[c] + fg * c111[c];
        }
      } else if (fb > fg) {
        out[c] = (1 - fb) * c000[c] + (fb - fg) * corner(ri, gi, bn)[c] +
                 (fg - fr) * corner(ri, gn, bn)[c] + fr * c111[c];
      } else if (fb > fr) {
        out[c] = (1 - fg) * c000[c] + (fg - fb) * corner(ri, gn, bi)[c] +
                 (fb - fr) * corner(ri, gn, bn)[c] + fr * c111[c];
      } else {
        out[c] = (1 - fg) * c000[c] + (fg - fr) * corner(ri, gn, bi)[c] +
                 (fr - fb) * corner(rn, gn, bi)[c] + fb * c111[c];
      }
    }
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
