// Images the adjustment tests feed to the fast paths and their references, and the byte-exact
// comparison between the two.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <vector>

#include "tessarofx/CubeLut.h"
#include "tessarofx/CxImage.h"

namespace tfx_test {

using Image = std::unique_ptr<CxImage>;
using Bytes = std::vector<uint8_t>;

Image Clone(const CxImage& src);

// Deterministic pseudo-random bytes.
std::vector<uint8_t> NoiseBytes(size_t count, uint32_t salt);

// Noise in every byte, padding included. Strides beyond Create()'s 4-byte padding come from
// wrapping, as frames arrive.
Image NoiseImage(unsigned width, unsigned height, unsigned bpp, _ImagePixelFormat format,
                 unsigned effWidth, uint32_t salt);

// The layouts besides packed BGRA that the image functions take through the accessors.
struct Layout {
  unsigned bpp;
  _ImagePixelFormat format;
};
inline constexpr Layout kLayouts[] = {{32, IPF_BGRA}, {32, IPF_RGBA}, {24, IPF_BGR},
                                      {24, IPF_RGB},  {16, IPF_RGB},  {8, IPF_Gray8}};

// A noise image in `layout` whose rows hold `pad` bytes beyond Create()'s padding to 4.
inline Image NoiseImage(const Layout& layout, unsigned width, unsigned height, unsigned pad,
                        uint32_t salt) {
  return NoiseImage(width, height, layout.bpp, layout.format,
                    (width * layout.bpp / 8 + 3) / 4 * 4 + pad, salt);
}

// Every 24-bit colour once, in a 4096-wide BGRA image, with an alpha that varies independently.
// Sanitizer builds, being many times slower, take every seventh colour.
const CxImage& EveryColour();

// Equal buffers, or the first differing byte with its pixel coordinates.
::testing::AssertionResult SameBuffer(const CxImage& expected, const CxImage& actual);

// `run` and `reference` each on a copy of `source`, compared as SameBuffer compares them.
template <class Run, class Reference>
::testing::AssertionResult SameResult(const CxImage& source, Run run, Reference reference) {
  const Image actual = Clone(source), expected = Clone(source);
  run(actual.get());
  reference(expected.get());
  return SameBuffer(*expected, *actual);
}

// Every pixel through the accessors, row by row, replaced by fn(pixel).
template <class Fn>
void MapPixels(CxImage* image, Fn fn) {
  for (unsigned long y = 0; y < image->GetHeight(); ++y) {
    for (unsigned long x = 0; x < image->GetWidth(); ++x) {
      image->SetPixelColor(x, y, fn(image->GetPixelColor(x, y, true)));
    }
  }
}

// The three components of lattice point (i, j, k), red index first, in the 64-point storage.
inline float* LatticePoint(CubeLut& lut, int i, int j, int k) {
  return lut.getLut3DData(nullptr, nullptr, nullptr, nullptr) +
         ((i * CubeLut::kMaxSize + j) * CubeLut::kMaxSize + k) * 3;
}

// The atlas is the whole tile image, 8N by ceil(N/8)N texels: blue slice k is tile k % 8 of tile
// row k / 8, red across and green down in it. Every point's texel holds its value truncated to
// int and cut to 8 bits.
::testing::AssertionResult AtlasMatches(CubeLut& lut);

}  // namespace tfx_test
