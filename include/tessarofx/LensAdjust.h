// Lens distortion and lateral colour fringing on a CxImage, by resampling through coordinate
// maps.
//
// The maps are expensive to build, so the library keeps the most recent ones process-wide, keyed
// by strength and frame size, and reuses them while those stay the same. The cache is
// thread-safe: filter objects with different settings may run on different threads at once.
// A strength of exactly 0 leaves everything untouched, and so does an image that is null, has no
// pixels, whose header does not describe its buffer (a bpp other than 8, 16, 24 or 32, a stride
// shorter than a row, or a size other than stride * height), or whose pixel count exceeds INT_MAX.
#pragma once

#include "tessarofx/CxImage.h"
#include "tessarofx/Export.h"

// Radial distortion, d in percent (-100..100; other values are applied as they stand, and
// samples that would fall outside the buffer leave their pixel unchanged). d > 0 magnifies the
// centre and keeps the corners in place (barrel: radius normalised by the half-diagonal, cubic
// term); d < 0 magnifies towards the edges (pincushion: normalised by the frame size, sixth-power
// term). The resampling walks width * height pixels of bpp / 8 bytes from the first byte,
// ignoring row padding, and adds the horizontal source coordinate as a BYTE offset, not a pixel
// offset: away from the centre column this samples the left part of each row and rotates the
// channels when the offset is not a multiple of the pixel size. Hosts rely on that look.
TFX_API CxImage* distortFilter(CxImage* img, float d);

// Lateral chromatic aberration, f in percent: red is sampled at (1 + 0.03 f / 100) and blue at
// (1 - 0.03 f / 100) times the radius green (and alpha) are sampled at, all on a tenth-power
// radial curve. Sample positions are clamped into the frame.
TFX_API CxImage* fringingFilter(CxImage* img, float f);

// Frees the cached maps; the next frame with a non-zero strength rebuilds them. Safe to call
// while other threads filter: maps in use stay alive until those calls return.
TFX_API void releaseLensVariables();
