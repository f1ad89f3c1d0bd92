// Whole-image hue rotation about the grey axis, and its per-pixel companions.
//
// The rotation is a 3 x 3 matrix acting on the three colour bytes in memory order (blue, green,
// red for BGRA). For the matrix product a positive angle turns red towards blue, that is, it
// lowers the HSL hue by the angle; 360 degrees is the identity up to rounding.
//
// The luma and mask helpers that belong to this family, calLuma(tagRGBQUAD),
// calMask(tagRGBQUAD, unsigned char) and mixLumaAndColor(tagRGBQUAD, unsigned char,
// unsigned char, float), are the vibrance per-pixel forms of ColorAdjust.h: the same functions
// with the same argument lists, declared once there and included here.
//
// Threads: every call computes the matrix it uses and keeps it on its own stack, so hue
// adjustments with different angles may run at once on different images. `matrix` is published
// for hosts that read it; its writers take a lock, so it always holds one whole matrix, the one
// written last. Reading it while another thread may write it is the reader's race.
#pragma once

#include "tessarofx/ColorAdjust.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/Export.h"

// Row-major [m0 m1 m2; m2 m0 m1; m1 m2 m0] of the last calculateHueMartrix or hueAdjustment
// call (the identity before any), with c = cos a, s = sin a (a in radians, double precision), m0 =
// (1 - c) / 3 + c, m1 = (1 - c) / 3 - 0.57735026 s, m2 = (1 - c) / 3 + 0.57735026 s.
extern TFX_API float matrix[9];

// Fills `matrix` for an angle in degrees.
TFX_API void calculateHueMartrix(float angle);

// Rotates the hue of every pixel by `angle` degrees and returns the image. Walks width * height
// pixels of bpp / 8 bytes from the first byte, ignoring row padding, and rewrites the first three
// bytes of each (pixels narrower than three bytes overlap; the walk stops before a window would
// leave the buffer). Per pixel, with bytes b0 b1 b2 and m = `matrix`, in float, each result
// stored at once (0 below 0, 255 above 255, else truncated):
//   n0 = m0 b0 + m1 b1 + m2 b2;  n1 = m3 n0 + m4 b1 + m5 b2;  n2 = m6 n0 + m7 n1 + m8 b2.
// Each row uses the bytes already rotated, so the result is not the matrix product (at 120
// degrees every pixel turns grey); that order is the defined behaviour. Windows whose three bytes
// are equal are greys and stay as they are (the float rows would otherwise truncate most of them
// one level down at almost every angle). Angle 0 or a non-finite angle, or an image that is null,
// has no pixels, or whose header does not describe its buffer (a bpp other than 8, 16, 24 or 32,
// a stride shorter than a row, or a size other than stride * height): nothing changes and
// `matrix` is not written.
TFX_API CxImage* hueAdjustment(CxImage* image, float angle);

// One pixel of hueAdjustment at `angle` (the matrix calculateHueMartrix would write), alpha
// kept. Does not touch `matrix`. Angle 0 or a non-finite angle returns the pixel unchanged.
TFX_API tagRGBQUAD transformHue1(tagRGBQUAD c, float angle);

// The exact rotation of a float colour about the grey axis, in the direction of hueAdjustment:
// the grey (r + g + b) / 3 is kept, and the chroma vector x = (2r - g - b) / sqrt 6,
// y = (g - b) / sqrt 2 keeps its length while its angle atan2(y, x), which is the hue, falls by
// `angle` degrees. In double precision, returned as float and not clamped, so values may leave
// 0..1. A non-finite angle returns the colour unchanged.
TFX_API _rgb transformHue2(_rgb c, float angle);
