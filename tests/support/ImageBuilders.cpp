#include "support/ImageBuilders.h"

#include <algorithm>
#include <cstring>
#include <string>

namespace tfx_test {

Image Clone(const CxImage& src) {
  Image copy = std::make_unique<CxImage>();
  copy->Copy(src);
  return copy;
}

Image NoiseImage(unsigned width, unsigned height, unsigned bpp, _ImagePixelFormat format,
                 unsigned effWidth, uint32_t salt) {
  std::vector<uint8_t> frame(size_t{effWidth} * height);
  uint8_t* bits = frame.data();
  Image image = Clone(CxImage(&bits, width, height, bpp, effWidth, format));
  const std::vector<uint8_t> noise = NoiseBytes(image->GetSize(), salt);
  std::memcpy(image->GetBits(), noise.data(), noise.size());
  return image;
}

const CxImage& EveryColour() {
#if defined(TFX_SANITIZE_BUILD)
  constexpr uint32_t kStep = 7;
#else
  constexpr uint32_t kStep = 1;
#endif
  static const Image image = [] {
    const uint32_t count = ((1u << 24) + kStep - 1) / kStep;
    Image all = std::make_unique<CxImage>(4096, (count + 4095) / 4096, 32, IPF_BGRA);
    uint8_t* p = all->GetBits();
    for (uint32_t i = 0; i < all->GetWidth() * all->GetHeight(); ++i, p += 4) {
      const uint32_t colour = (i * kStep) & 0xffffff;
      const uint8_t pixel[4] = {uint8_t(colour), uint8_t(colour >> 8), uint8_t(colour >> 16),
                                uint8_t((i * 2654435761u) >> 24)};
      std::memcpy(p, pixel, 4);
    }
    return all;
  }();
  return *image;
}

::testing::AssertionResult SameBuffer(const CxImage& expected, const CxImage& actual) {
  if (expected.GetSize() != actual.GetSize()) {
    return ::testing::AssertionFailure()
           << "sizes differ: " << expected.GetSize() << " vs " << actual.GetSize();
  }
  const uint8_t* e = expected.GetBits();
  const uint8_t* a = actual.GetBits();
  if (std::memcmp(e, a, expected.GetSize()) == 0) return ::testing::AssertionSuccess();
  size_t i = 0;
  while (e[i] == a[i]) ++i;
  const size_t row = i / expected.GetEffWidth();
  const size_t column = i % expected.GetEffWidth();
  const size_t pixelBytes = std::max<size_t>(1, expected.GetBpp() / 8);
  const size_t pixelStart = row * expected.GetEffWidth() + column / pixelBytes * pixelBytes;
  auto bytes = [&](const uint8_t* p) {
    std::string s;
    for (size_t j = 0; j < pixelBytes && pixelStart + j < expected.GetSize(); ++j) {
      s += (j ? " " : "") + std::to_string(p[pixelStart + j]);
    }
    return s;
  };
  return ::testing::AssertionFailure()
         << "first difference at byte " << i << " (row " << row << ", pixel " << column / pixelBytes
         << ", byte " << column % pixelBytes << "): expected pixel [" << bytes(e) << "], got ["
         << bytes(a) << "]";
}

std::vector<uint8_t> NoiseBytes(size_t count, uint32_t salt) {
  std::vector<uint8_t> bytes(count);
  uint32_t state = salt * 2654435761u + 1;
  for (uint8_t& b : bytes) {
    state ^= state << 13;
    state ^= state >> 17;
    state ^= state << 5;
    b = static_cast<uint8_t>(state >> 7);
  }
  return bytes;
}

::testing::AssertionResult AtlasMatches(CubeLut& lut) {
  const int n = lut.getLutSize();
  int bytes = 0;
  const uint8_t* atlas = lut.getAtlasData(&bytes);
  if (!atlas || bytes != 8 * n * ((n + 7) / 8) * n * 3) {
    return ::testing::AssertionFailure() << "atlas of " << bytes << " bytes for " << n << " points";
  }
  for (int k = 0; k < n; ++k) {
    for (int j = 0; j < n; ++j) {
      for (int i = 0; i < n; ++i) {
        const uint8_t* a = atlas + ((k % 8 + (k / 8 * n + j) * 8) * n + i) * 3;
        for (int c = 0; c < 3; ++c) {
          if (a[c] != static_cast<uint8_t>(static_cast<int>(LatticePoint(lut, i, j, k)[c]))) {
            return ::testing::AssertionFailure() << "texel of point " << i << "," << j << "," << k;
          }
        }
      }
    }
  }
  return ::testing::AssertionSuccess();
}

}  // namespace tfx_test
