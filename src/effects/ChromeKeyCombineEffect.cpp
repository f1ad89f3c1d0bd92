// ChromeKeyCombine: joins a key mask (the background, as ChromeKeyLut3d mode 0 makes it) and the
// keyed colours (the foreground, mode 1) into one BGRA image with the mask as alpha.
#include <algorithm>

#include "plugin/NLEDynamicEffect.h"

namespace {

// Below this colour alpha a pixel is dropped whatever the mask says.
constexpr int kMinColourAlpha = 10;

int64_t PixelCount(int width, int height) {
  return width > 0 && height > 0 ? static_cast<int64_t>(width) * height : 0;
}

class NLEChromeKeyCombineEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEChromeKeyCombineEffect(); }

  // All three images are taken as tightly packed pixels, which is how the pipeline hands them
  // over, and pixel p of the output comes from pixel p of each input. Only the pixels that all
  // three hold are written; a smaller input leaves the rest of the output as it was. Without a
  // mask there is nothing to combine, so a missing background is refused like a missing
  // foreground.
  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int, const uint8_t* mask, int maskWidth,
                int maskHeight, int, const uint8_t* colour, int colourWidth, int colourHeight,
                int) override {
    if (!dst || !colour || !mask) return NLE_E_INVALIDARG;
    const int64_t count =
        std::min({PixelCount(dstWidth, dstHeight), PixelCount(maskWidth, maskHeight),
                  PixelCount(colourWidth, colourHeight)});
    for (int64_t p = 0; p < count * 4; p += 4) {
      // Read before writing: the output may be the colour frame itself.
      const int a = colour[p + 3];
      const uint8_t b = static_cast<uint8_t>(a * colour[p] / 255);
      const uint8_t g = static_cast<uint8_t>(a * colour[p + 1] / 255);
      const uint8_t r = static_cast<uint8_t>(a * colour[p + 2] / 255);
      // The mask is grey; its first byte serves.
      const uint8_t alpha = a < kMinColourAlpha ? 0 : mask[p];
      dst[p] = b;
      dst[p + 1] = g;
      dst[p + 2] = r;
      dst[p + 3] = alpha;
    }
    return 0;
  }
};

const NLEChromeKeyCombineEffect::_auto_register s_register(tfx::catalog::kChromeKeyCombine.wideGuid,
                                                           L"ChromeKeyCombine",
                                                           &NLEChromeKeyCombineEffect::create);

}  // namespace
