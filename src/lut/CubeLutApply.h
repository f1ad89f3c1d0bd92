// Tetrahedral application of a CubeLut lattice to rows of 8-bit pixels, and the byte conversions
// the lattice code shares. Internal to the plug-in.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>

namespace tfx {

// What one application needs from a CubeLut: the 64-strided float lattice and the per-byte
// tables. `size` is N, already checked to be 1..64.
struct TetraTable {
  const float* lattice;  // [64][64][64][3]
  const float* ft;       // [256]
  const int32_t* gt;     // [256]
  int size;
};

// Float-to-int conversion as the x86 truncating instructions do it: toward zero, and the
// "integer indefinite" 0x80000000 for NaN and values outside int32, so hostile lattices give
// defined bytes. Only the low 8 bits are kept.
inline uint8_t TruncatedLowByte(double v) {
  if (!(v > -2147483649.0 && v < 2147483648.0)) return 0;
  return static_cast<uint8_t>(static_cast<int32_t>(v));
}

// One interpolated component to a byte: +0.5 and an upper clamp in double, no lower clamp, so a
// result below -0.5 wraps through its low 8 bits.
inline uint8_t LutComponentToByte(float v) {
  double w = static_cast<double>(v) + 0.5;
  if (w > 255.0) w = 255.0;  // NaN passes, as through std::min(w, 255.0)
  return TruncatedLowByte(w);
}

// doLUT's tetrahedra at one point of a cell: `c000` is the lower corner, and dr, dg, db the
// distances (in floats) to the upper neighbour along red, green and blue, 0 where the lattice
// ends. The path from the lower to the upper corner follows the fractions in decreasing order,
// strict comparisons tested in this order; every caller shares this arithmetic, so a table
// resampled with it means what applying it does.
inline void Tetrahedral(const float* c000, ptrdiff_t dr, ptrdiff_t dg, ptrdiff_t db, float fr,
                        float fg, float fb, float out[3]) {
  float w0, w1, w2, w3;  // weights of the lower corner, the two between, the upper
  const float *m1, *m2;  // the two corners between
  if (fr > fg) {
    if (fg > fb) {
      w0 = 1 - fr, w1 = fr - fg, w2 = fg - fb, w3 = fb, m1 = c000 + dr, m2 = c000 + dr + dg;
    } else if (fr > fb) {
      w0 = 1 - fr, w1 = fr - fb, w2 = fb - fg, w3 = fg, m1 = c000 + dr, m2 = c000 + dr + db;
    } else {
      w0 = 1 - fb, w1 = fb - fr, w2 = fr - fg, w3 = fg, m1 = c000 + db, m2 = c000 + dr + db;
    }
  } else if (fb > fg) {
    w0 = 1 - fb, w1 = fb - fg, w2 = fg - fr, w3 = fr, m1 = c000 + db, m2 = c000 + dg + db;
  } else if (fb > fr) {
    w0 = 1 - fg, w1 = fg - fb, w2 = fb - fr, w3 = fr, m1 = c000 + dg, m2 = c000 + dg + db;
  } else {
    w0 = 1 - fg, w1 = fg - fr, w2 = fr - fb, w3 = fb, m1 = c000 + dg, m2 = c000 + dr + dg;
  }
  const float* c111 = c000 + dr + dg + db;
  for (int c = 0; c < 3; ++c) out[c] = w0 * c000[c] + w1 * m1[c] + w2 * m2[c] + w3 * c111[c];
}

// Releases storage from the allocator of the lattice and slab blocks.
struct FreeBlocks {
  void operator()(void* p) const;
};

// A TetraTable laid out for the vector rows. Copying the lattice costs a small part of one 4K frame
// and is what lets the rows read each corner as one 16-byte block: the N^3 points, and a last plane
// repeated along each axis, packed one after another (blue fastest), each as red, green, blue and a
// 0 or as those three alone (TetraPointFloats), or as one float when every point is grey (the three
// components the same bits, so one blend gives all three bytes, as a key mask does), and per axis
// the offset in floats of each byte's lower point.
class TetraPlan {
 public:
  // Reads the table as it is now; a later change to it is not seen until the next Prepare.
  // `pointFloats` (3 or 4) lays out colour points as TetraPointFloats describes; any other value
  // takes what the instruction set Highway picks now prefers. Every instruction set reads both.
  void Prepare(const TetraTable& table, int pointFloats = 0);

  const TetraTable& Table() const { return table_; }
  // False for a size outside 1..64, which doLUT refuses; such a plan leaves pixels alone.
  bool Usable() const { return usable_; }
  // False when an index table entry lies outside the lattice's N points: only the reference
  // reads such a table the way doLUT always has.
  bool Packed() const { return packed_; }
  bool Grey() const { return grey_; }
  // Whether every packed point and every fraction is finite.
  bool Finite() const { return finite_; }
  const float* Points() const { return points_.get(); }
  const float* Fractions() const { return ft_; }
  // Where each byte lies along an axis, in lattice points: its lower index plus its fraction, when
  // that sum gives both back exactly (floor and remainder), as for the tables doLUT builds; then
  // one look-up a byte does for two. Null otherwise.
  const float* Positions() const { return positional_ ? position_ : nullptr; }
  // Two floats, high and low, with v * high + v * low (each product rounded, then the sum) the
  // position of every byte v, as for doLUT's own tables; 0 where no such pair was found.
  float Scale(int part) const { return scale_[part]; }
  const int32_t* Lower(int axis) const { return lower_[axis]; }  // red 0, green 1, blue 2
  int32_t Stride(int axis) const { return stride_[axis]; }       // floats between points

  // A packed lattice too large for a core's second-level cache is applied a slab at a time:
  // pixels are sorted by the range of red cells they fall in, each slab's pixels go through
  // together while its planes stay cached, and the results are put back in order. 1 where the
  // lattice fits (or the index table does not rise with the byte, so that slabs have no bytes).
  static constexpr int kMaxSlabs = 4;
  int Slabs() const { return slabs_; }
  // The first red byte of slab s, 1 <= s < Slabs(); a byte's slab is how many of these it reaches.
  int SlabStart(int s) const { return slabStart_[s]; }

 private:
  TetraTable table_{};
  bool usable_ = false;
  bool packed_ = false;
  bool grey_ = false;
  bool finite_ = false;
  size_t capacity_ = 0;  // floats
  std::unique_ptr<float[], FreeBlocks> points_;
  float ft_[256] = {};
  float position_[256] = {};
  bool positional_ = false;
  float scale_[2] = {};
  int32_t lower_[3][256] = {};
  int32_t stride_[3] = {};
  int slabs_ = 1;
  int slabStart_[kMaxSlabs] = {};
};

// Applies the table to `width` pixels of `bytesPerPixel` bytes (blue, green, red first) from `in`
// to `out`, which is either `in` itself or a row that does not overlap it.
void TetraRow(const TetraPlan& plan, const uint8_t* in, uint8_t* out, int width, int bytesPerPixel);

// doLUT's checks and rows over a whole image, in place or from `in` (with its own pitch) to
// `pixels`; images its arguments cannot describe, and plans that are not Usable, are left alone.
void TetraImage(const TetraPlan& plan, const uint8_t* in, int inPitch, uint8_t* pixels, int width,
                int height, int pitch, int bytesPerPixel);

// The plain per-pixel formula, one comparison chain per pixel: the reference every fast path is
// held to.
void TetraRowReference(const TetraTable& table, uint8_t* row, int width, int bytesPerPixel);

}  // namespace tfx
