// lutAToWhiteEffect: makes the fully transparent pixels of a keyed image opaque black, so that a
// host without alpha sees the key's hole as black.
#include <algorithm>
#include <cstring>

#include "plugin/NLEDynamicEffect.h"

namespace {

int64_t PixelCount(int width, int height) {
  return width > 0 && height > 0 ? static_cast<int64_t>(width) * height : 0;
}

class NLE3dlutAToWhiteEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLE3dlutAToWhiteEffect(); }

  // Both images are taken as tightly packed pixels, as the pipeline hands them over. The name
  // says white, but transparent pixels have always become black, and hosts expect that. Only
  // the pixels both images hold are written.
  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int, const uint8_t*, int, int, int,
                const uint8_t* src, int srcWidth, int srcHeight, int) override {
    if (!dst || !src) return NLE_E_INVALIDARG;
    if (srcHeight == 0) return 0;
    const int64_t count =
        std::min(PixelCount(srcWidth, srcHeight), PixelCount(dstWidth, dstHeight));
    for (int64_t p = 0; p < count * 4; p += 4) {
      if (src[p + 3] != 0) {
        std::memmove(dst + p, src + p, 4);  // the output may be the input frame itself
      } else {
        dst[p] = dst[p + 1] = dst[p + 2] = 0;
        dst[p + 3] = 255;
      }
    }
    return 0;
  }
};

const NLE3dlutAToWhiteEffect::_auto_register s_register(tfx::catalog::kAToWhite.wideGuid,
                                                        L"lutAToWhiteEffect",
                                                        &NLE3dlutAToWhiteEffect::create);

}  // namespace
