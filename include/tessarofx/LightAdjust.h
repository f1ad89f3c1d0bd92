// Highlights, shadows, white and black levels on a CxImage, with their per-pixel and per-channel
// forms.
//
// All four rest on one tone curve of a channel value ch (0..255) with a weight k:
//
//   E(ch, k) = 255 - (255 - ch) * (255 - k * ch) / 255
//
// k = 0 leaves ch as it is, k > 0 brightens (most in the middle tones), k < 0 darkens; 0 and 255
// are fixed points. Each pixel gets its own k from M = max(red, green, blue) / 255: the highlight
// and white-level operations weight by M, the shadow and black-level operations by 1 - M.
//
// The image functions change blue, green and red in place, keep alpha, and return the image they
// were given. A strength of exactly 0 leaves everything untouched, and so does an image that is
// null, has no pixels, or whose header does not describe its buffer: a bpp other than 8, 16, 24
// or 32, a stride shorter than a row, or a size other than stride * height (as when that product
// wrapped 32 bits). Strengths are not range-checked. Every image format is accepted; 32-bit BGRA
// and RGBA are rewritten row by row, giving the same bytes as the per-pixel forms.
#pragma once

#include "tessarofx/CxImage.h"
#include "tessarofx/Export.h"

// k = M * h / 100; each channel becomes the low 8 bits of trunc(E(ch, k)), not clamped (for
// |h| <= 100 the curve stays within 0..255). h = 100 takes a grey 128 to 159.
TFX_API CxImage* hdrHighlight(CxImage* image, float h);

// k = (1 - M) * f with f = s / 100 * 2 for s > 0 and s / 100 * 0.5 for s < 0: lifting shadows is
// four times as strong as deepening them. Channels as in hdrHighlight (low 8 bits, no clamp).
TFX_API CxImage* hdrShadow(CxImage* image, float s);

// k = M * w / 100; for k > 0 the curve is applied twice, t = E(E(ch, k), k), else once. Each
// channel becomes trunc(t) limited to 0..255.
TFX_API CxImage* hdrWhiteLevel(CxImage* image, float w);

// k = (1 - M) * f with f = k0 / 100 * 0.5 for k0 > 0 and k0 / 100 * 2 for k0 < 0 (the opposite
// asymmetry to hdrShadow). Each channel becomes trunc(E(ch, k)) limited to 0..255.
TFX_API CxImage* hdrBlackLevel(CxImage* image, float k0);

// The curve E(ch, k) truncated toward zero, keeping the low 8 bits. A result beyond the int range
// (or NaN, from absurd weights) gives 0.
TFX_API unsigned char enHanceColor(float ch, float k);

// E(E(ch, k), k) when k > 0, else E(ch, k); neither truncated nor limited.
TFX_API float whiteToneColor(float ch, float k);

// E(ch, k), neither truncated nor limited.
TFX_API float blackToneColor(float ch, float k);

// The same curve as blackToneColor.
TFX_API float highLightColor(float ch, float k);

// hdrHighlight on one pixel for a = h / 100: k = M * a, each channel enHanceColor(ch, k).
TFX_API tagRGBQUAD calHighlight(tagRGBQUAD c, float a);

// hdrShadow on one pixel for a = f (already scaled by 2 or 0.5): k = (1 - M) * a, each channel
// enHanceColor(ch, k).
TFX_API tagRGBQUAD calShadow(tagRGBQUAD c, float a);

// hdrWhiteLevel on one pixel for a = w / 100: k = M * a, each channel whiteToneColor(ch, k),
// truncated and limited to 0..255.
TFX_API tagRGBQUAD calWhiteLevelPixel(tagRGBQUAD c, float a);

// hdrBlackLevel on one pixel for a = f (already scaled by 0.5 or 2): k = (1 - M) * a, each channel
// blackToneColor(ch, k), truncated and limited to 0..255.
TFX_API tagRGBQUAD calBlackLevelPixel(tagRGBQUAD c, float a);
