// Program "LUT", kernel "MAIN": a 3D LUT applied to BGRA8 frame buffers (rows packed, one work
// item per pixel) by tetrahedral interpolation, to the byte what the plug-in's CPU table
// application gives: the same corners, the same float expressions in the same order, and the
// same rounding of each component.
//
// Arguments:
//   0 src, 1 dst    BGRA8 pixels, width x height (the global work size), packed rows
//   2 lattice       float[axis][axis][axis][point]: red index outermost, then green, then blue
//   3 fraction      float[256]: each byte's position between its two lattice points
//   4 grid          int[256]: each byte's lower lattice point
//   5 axis          lattice points per axis as stored (64); only the first n are used
//   6 point         floats per lattice point (3: red, green, blue)
//   7 n             lattice points per axis in use, 1..axis; anything else copies the pixel
// Alpha passes through.

// Contraction to fused multiply-add would change the last bit of the sums.
#pragma OPENCL FP_CONTRACT OFF

// The CPU rounds (double)v + 0.5, caps it at 255 and truncates toward zero to a 32-bit integer
// whose low byte it keeps (NaN and values outside int32 give 0). Devices need not have doubles,
// so this reaches the same byte in float and integer steps, all of them exact.
uchar component_to_byte(float v) {
  if (isnan(v)) return 0;
  if (v > 254.5f) return 255;              // v + 0.5 > 255
  if (v < -2147483648.0f) return 0;        // v + 0.5 below the smallest int32
  const float f = floor(v);
  const float r = v - f;                   // exact: the fraction of a float is a float
  int t = (int)f;
  if (v >= -0.5f) {
    t += r >= 0.5f ? 1 : 0;                // floor(v + 0.5)
  } else {
    t += r > 0.5f ? 2 : 1;                 // ceil(v + 0.5): truncation of a negative value
  }
  return (uchar)t;
}

kernel void MAIN(global const uchar4* src, global uchar4* dst, global const float* lattice,
                 global const float* fraction, global const int* grid, int axis, int point,
                 int n) {
  const size_t i = get_global_id(1) * get_global_size(0) + get_global_id(0);
  const uchar4 p = src[i];  // x blue, y green, z red, w alpha
  if (n < 1 || n > axis || point < 3) {
    dst[i] = p;
    return;
  }
  const int sr = axis * axis * point, sg = axis * point, sb = point;
  const int last = n - 1;
  const int ri = grid[p.z], gi = grid[p.y], bi = grid[p.x];
  const float fr = fraction[p.z], fg = fraction[p.y], fb = fraction[p.x];
  const int rn = ri + 1 < last ? ri + 1 : last;
  const int gn = gi + 1 < last ? gi + 1 : last;
  const int bn = bi + 1 < last ? bi + 1 : last;
  global const float* c000 = lattice + ri * sr + gi * sg + bi * sb;
  global const float* c111 = lattice + rn * sr + gn * sg + bn * sb;
  // The two inner corners of the tetrahedron the fractions fall in, and its four weights.
  global const float* c1;
  global const float* c2;
  float w0, w1, w2, w3;
  if (fr > fg) {
    if (fg > fb) {
      c1 = lattice + rn * sr + gi * sg + bi * sb;
      c2 = lattice + rn * sr + gn * sg + bi * sb;
      w0 = 1 - fr; w1 = fr - fg; w2 = fg - fb; w3 = fb;
    } else if (fr > fb) {
      c1 = lattice + rn * sr + gi * sg + bi * sb;
      c2 = lattice + rn * sr + gi * sg + bn * sb;
      w0 = 1 - fr; w1 = fr - fb; w2 = fb - fg; w3 = fg;
    } else {
      c1 = lattice + ri * sr + gi * sg + bn * sb;
      c2 = lattice + rn * sr + gi * sg + bn * sb;
      w0 = 1 - fb; w1 = fb - fr; w2 = fr - fg; w3 = fg;
    }
  } else if (fb > fg) {
    c1 = lattice + ri * sr + gi * sg + bn * sb;
    c2 = lattice + ri * sr + gn * sg + bn * sb;
    w0 = 1 - fb; w1 = fb - fg; w2 = fg - fr; w3 = fr;
  } else if (fb > fr) {
    c1 = lattice + ri * sr + gn * sg + bi * sb;
    c2 = lattice + ri * sr + gn * sg + bn * sb;
    w0 = 1 - fg; w1 = fg - fb; w2 = fb - fr; w3 = fr;
  } else {
    c1 = lattice + ri * sr + gn * sg + bi * sb;
    c2 = lattice + rn * sr + gn * sg + bi * sb;
    w0 = 1 - fg; w1 = fg - fr; w2 = fr - fb; w3 = fb;
  }
  float out[3];
  for (int c = 0; c < 3; ++c) {
    out[c] = w0 * c000[c] + w1 * c1[c] + w2 * c2[c] + w3 * c111[c];
  }
  dst[i] = (uchar4)(component_to_byte(out[2]), component_to_byte(out[1]),
                    component_to_byte(out[0]), p.w);
}
