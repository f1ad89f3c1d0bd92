// Per-colour hue, saturation and lightness in eight hue bands: the HSLAdjust effect and the
// function behind it.
//
// Bands and their centres on the HSL hue circle (degrees): red 0, orange 30, yellow 60,
// green 120, aqua 180, blue 240, purple 270, magenta 300. Each band has five values, all
// -100..100 with 0 as default (values beyond are taken as the nearest limit, NaN as 0):
//
//   hue    shifts the band's colours along the hue circle: +100 moves them onto the next
//          band's centre (red towards orange, magenta towards red), -100 onto the previous one.
//   sat    scales the colours' chroma at constant lightness: -100 gives grey, +100 doubles it
//          (no further than the most saturated colour of that lightness, so hue is kept).
//   light  blends towards white (+100 reaches white) or black (-100 reaches black), at full
//          strength for colours with a chroma of 64 or more and fading to nothing towards grey,
//          so that noise around greys does not flicker.
//   width  scales the band's reach: 0 puts its half-way edge midway to each neighbouring
//          centre; +100 doubles and -100 halves that distance.
//   soft   shares the edge between plateau and fade: 0 fades over half of the reach either side
//          of the edge, +100 over all of it (no plateau), -100 over a tenth (nearly hard).
//
// Model. For a pixel with channels r, g, b (0..255): mx = max, mn = min, C = mx - mn. Greys
// (C = 0) are never changed. The hue position p in 0 .. 6C - 1 is g - b (plus 6C when negative)
// when r is the maximum, else 2C + b - r when g is, else 4C + r - g; hue = 60 p / C degrees. The
// band weights are taken at the hue index j = floor(256 p / C), i.e. at j * 360 / 1536 degrees.
// A band with centre c, edge distances E (towards lower hues: half the gap to the previous centre
// times 2^(width / 100); towards higher hues: the same with the next centre) and fade half-widths
// T = f E, where f = 0.5 + 0.5 soft / 100 for soft >= 0 and 0.5 + 0.4 soft / 100 below, weighs a
// hue at distance d from c (wrapped into -180..180, E and T of d's side) with
// t = clamp((E + T - |d|) / (2 T), 0, 1), w = t^2 (3 - 2 t): smooth, so a hue sweep shows no
// seams; at width 0 and equal soft neighbouring weights add up to 1. With the band values taken
// as hue / 100 times the gap on its side (degrees), sat / 100 and light / 100, every hue index
// gets, in double precision and then stored as float:
//   S = (sum of w * shift, wrapped into [-180, 180)) / 60,  K = max(0, 1 + sum of w * sat),
//   L = clamp(sum of w * light, -1, 1).
// A pixel whose S is 0, K is 1 and L is 0 is left as it is. Otherwise, in float, starting from
// the channels themselves:
//   1. Hue, when S != 0: q = p + S C, wrapped once into 0 .. 6C; k = the number of n in 1..5
//      with q >= n C; x = q - k C; rise = mn + x, fall = mx - x; by sector k, (r, g, b) becomes
//      0: (mx, rise, mn), 1: (fall, mx, mn), 2: (mn, mx, rise), 3: (mn, fall, mx),
//      4: (rise, mn, mx), 5: (mx, mn, fall). Max, min and so HSL lightness and saturation stay.
//   2. Saturation, when K != 1: m = (mx + mn) / 2, s = min(C K, 255 - |mx + mn - 255|) / C;
//      each channel v becomes m + (v - m) s.
//   3. Lightness, with l = L min(1, C / 64) when l != 0: each channel v becomes
//      v + (255 - v) l when l > 0, else v + v l.
//   4. Each channel is rounded to nearest (trunc(v + 0.5)) and limited to 0..255. Alpha is kept.
// The image function computes the per-hue tables once per parameter set (and keeps the last
// set's tables per thread), then runs one pass over the pixels; it gives the same bytes as the
// formulas above evaluated pixel by pixel.
#pragma once

#include "tessarofx/CxImage.h"
#include "tessarofx/Export.h"

enum HSLBandIndex : int {
  kHSLRed = 0,
  kHSLOrange,
  kHSLYellow,
  kHSLGreen,
  kHSLAqua,
  kHSLBlue,
  kHSLPurple,
  kHSLMagenta,
  kHSLBandCount
};

// The five values of one band (see above).
struct HSLBandValues {
  float hue;
  float sat;
  float light;
  float width;
  float soft;
};

// Values for every band, indexed by HSLBandIndex; value-initialise (HSLBands{}) for all zeros.
struct HSLBands {
  HSLBandValues band[kHSLBandCount];
};

// Applies the bands to the image in place and returns it. 32-bit BGRA and RGBA frames go
// through a direct row loop, other layouts through the per-pixel accessors (8-bit grey images
// are unchanged). Row padding is left alone. Bands whose hue, sat and light are all 0 leave
// everything untouched, and so does an image that is null, has no pixels, or whose header does
// not describe its buffer (a bpp other than 8, 16, 24 or 32, a stride shorter than a row, or a
// size other than stride * height).
TFX_API CxImage* hslAdjustment(CxImage* image, const HSLBands& bands);
