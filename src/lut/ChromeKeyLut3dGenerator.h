// The chroma keyer behind the ChromeKeyLut3d effects: from a screen colour it builds two 64-point
// 3D LUTs, an alpha LUT that turns every colour into a key mask and a beauty LUT that takes the
// screen's spill out of the colours that are kept. Internal to the plug-in.
//
// The model works on HSV (hue in degrees, saturation and value 0..1) and on chroma C = S * V,
// which is max - min of the colour and grows linearly as a colour is mixed with the screen:
// a pixel that is a fraction a of a grey subject and 1 - a of the screen has exactly (1 - a)
// times the screen's chroma. That is what makes the edges of a key soft in the right places.
//
// Key-likeness of a colour (h, S, V), with the screen at (Hk, Sk, Vk), chroma Ck:
//   d    = hue distance |h - Hk| in degrees (0..180)
//   w(d) = 1 up to the hue tolerance, then a smoothstep down to 0 over the hue softness
//   ref  = Ck * g(V / Vk), the chroma a screen-coloured pixel of that brightness would have:
//          g(x) = 1 - shadow * (1 - x) below the screen's brightness, 1 + highlight * (x - 1)
//          above it (shadow, highlight: the two tolerances as fractions)
//   k    = w(d) * C / ref: 0 for colours unlike the screen, 1 for the screen itself, above 1
//          for colours more saturated than the screen
// Colours whose saturation or value (0..255) lie outside their windows are protected: k = 0 and
// no spill removal.
//
// Alpha: a linear ramp of k, falling from 1 (kept) to 0 (keyed) over a band of width
// 1 - contrast / 100 centred on 0.5 + offset / 200. Contrast 0 gives alpha = 1 - k, contrast 50 a
// ramp from k = 0.25 to 0.75, contrast 100 a hard threshold; a positive offset moves the
// threshold towards the screen and keeps more. The alpha LUT carries the mask, 0..255, in all
// three components.
//
// Spill: within W = tolerance + softness degrees of the screen's hue, a colour is pushed, in the
// chroma plane (C at angle d from the screen's hue), along the screen's direction towards the
// edge of that wedge: at full strength it lands on the edge (hue Hk +- W) with only its chroma
// across the screen's direction left, C * sin d / sin W. Like the colour-difference despill
// G' = min(G, max(R, B)) of a green screen (W = 60), no kept colour is left with the screen's
// hue; the chroma is measured on the hue circle rather than on the RGB hexagon. The chroma
// removed darkens the colour (value falls with it) unless the luminance restore gives it back.
// Greys, and hues W or more away from the screen, are left unchanged. A grey screen (no chroma)
// keys nothing: alpha 255 and an unchanged beauty LUT.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

// The keyer's settings, laid out as the effects fill them. The effects pass the screen colour,
// contrast and offset from their parameters and the fixed values noted for the other fields.
struct lutParam {
  uint8_t keyRed;             // screen colour
  uint8_t keyGreen;           //
  uint8_t keyBlue;            //
  uint8_t reserved;           // 0; no meaning
  int32_t hueTolerance;       // 40: degrees either side of the screen's hue that key in full
  int32_t hueSoftness;        // 30: degrees over which keying fades out beyond the tolerance
  int32_t saturationLow;      // 0:   saturation window (0..255) of colours that may be keyed
  int32_t saturationHigh;     // 255
  int32_t valueLow;           // 0:   value (brightness, 0..255) window of colours that may be keyed
  int32_t valueHigh;          // 255
  double shadowTolerance;     // 50.0: % by which a darker colour still counts as screen in shadow
  double highlightTolerance;  // 0.0:  % by which a brighter colour must out-saturate the screen
  double lumaRestore;         // 50.0: % of the brightness lost with the spill that is given back
  double spillStrength;       // 100.0: % of the spill removed
  double contrast;            // 0..100, default 50: steepness of the alpha ramp
  double offset;              // -100..100, default 0: moves the alpha threshold
};

static_assert(offsetof(lutParam, hueTolerance) == 4, "lutParam layout");
static_assert(offsetof(lutParam, valueLow) == 20, "lutParam layout");
static_assert(offsetof(lutParam, shadowTolerance) == 32, "lutParam layout");
static_assert(offsetof(lutParam, contrast) == 64, "lutParam layout");
static_assert(sizeof(lutParam) == 80, "lutParam layout");

class NLEChromeKeyLut3dGenerator {
 public:
  static constexpr int kPoints = 64;  // lattice points per axis, as CubeLut holds them

  NLEChromeKeyLut3dGenerator();

  // The effects' record for a screen colour, contrast and offset.
  static lutParam DefaultParam(uint8_t red, uint8_t green, uint8_t blue, double contrast,
                               double offset);

  void setLutParam(lutParam param);
  // Derives the screen's HSV and the working constants from the settings and, once per object,
  // the HSV coordinates of every lattice point.
  void preProcess();
  // Each fills all 64^3 points of a CubeLut float lattice (lattice[i][j][k][3], red index i
  // outermost; point n stands for input level n * 255 / 63) with red, green, blue in 0..255.
  void getBeautyLut(float* lattice);
  void getAlphaLut(float* lattice);

  // How many LUTs of each kind all generators of the process have built, so that tests and
  // benchmarks can see which tables a parameter change rebuilt.
  static uint64_t beautyLutsBuilt();
  static uint64_t alphaLutsBuilt();

 private:
  struct Key {
    bool keys;  // false for a grey screen, which keys nothing
    double hue, chroma, value;
    double tolerance, softness, spillWedge;                     // degrees
    double saturationLow, saturationHigh, valueLow, valueHigh;  // 0..1
    double shadow, highlight, restore, strength;                // fractions
    double bandHigh, bandWidth;  // alpha ramp: 1 below bandHigh - bandWidth, 0 from bandHigh
  };

  bool Protected(double s, double v) const;
  double KeyLikeness(double h, double s, double v) const;

  lutParam param_;
  Key key_;
  bool prepared_;             // key_ matches param_
  std::vector<float> input_;  // HSV of every lattice point, in lattice order
};
