// The arithmetic of the light adjustments that does not depend on channels being bytes: the
// enhance curve, the per-pixel weights and the strength factors. The image functions tabulate
// them over bytes; the LUT-lattice twins evaluate them on lattice floats. Everything is float.
#pragma once

namespace tfx {

// E(ch, k) = 255 - (255 - ch) * (255 - k * ch) / 255.
inline float Curve(float ch, float k) {
  return 255.0f - (255.0f - ch) * (255.0f - k * ch) / 255.0f;
}

// White level: the curve twice when it brightens, once when it darkens.
inline float WhiteCurve(float ch, float k) {
  const float t = Curve(ch, k);
  return k > 0.0f ? Curve(t, k) : t;
}

// Weights from the brightest channel (0..255): highlight and white level weigh bright pixels,
// shadow and black level dark ones.
inline float BrightWeight(float brightest, float a) { return brightest / 255.0f * a; }
inline float DarkWeight(float brightest, float a) { return (1.0f - brightest / 255.0f) * a; }

// The per-pixel argument of each operation from its strength.
inline float HighlightFactor(float h) { return h / 100.0f; }
inline float ShadowFactor(float s) { return s / 100.0f * (s > 0.0f ? 2.0f : 0.5f); }
inline float WhiteLevelFactor(float w) { return w / 100.0f; }
inline float BlackLevelFactor(float k0) { return k0 / 100.0f * (k0 > 0.0f ? 0.5f : 2.0f); }

}  // namespace tfx
