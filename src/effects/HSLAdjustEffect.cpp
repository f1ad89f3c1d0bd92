// HSLAdjust: per-colour hue, saturation and lightness in eight bands.
#include <array>
#include <string>

#include "plugin/NLEDynamicEffect.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/HSLAdjust.h"

namespace {

constexpr const wchar_t* kBandNames[kHSLBandCount] = {L"red",  L"orange", L"yellow", L"green",
                                                      L"aqua", L"blue",   L"purple", L"magenta"};
constexpr const wchar_t* kValueNames[5] = {L"hue", L"sat", L"light", L"width", L"soft"};

// "u_<band>_<value>", band-major in HSLBandValues order; the longest is 15 characters.
const std::array<std::wstring, kHSLBandCount * 5>& ParamNames() {
  static const std::array<std::wstring, kHSLBandCount* 5> names = [] {
    std::array<std::wstring, kHSLBandCount * 5> all;
    for (int b = 0; b < kHSLBandCount; ++b) {
      for (int v = 0; v < 5; ++v) {
        all[b * 5 + v] = std::wstring(L"u_") + kBandNames[b] + L"_" + kValueNames[v];
      }
    }
    return all;
  }();
  return names;
}

class NLEHSLAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEHSLAdjustEffect(); }

  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int dstStride, const uint8_t*, int, int,
                int, const uint8_t* src, int srcWidth, int srcHeight, int srcStride) override {
    if (!dst || !src) return NLE_E_INVALIDARG;
    // Absent parameters are 0, the neutral value of every one of them.
    HSLBands bands{};
    const auto& names = ParamNames();
    for (int b = 0; b < kHSLBandCount; ++b) {
      float* values[5] = {&bands.band[b].hue, &bands.band[b].sat, &bands.band[b].light,
                          &bands.band[b].width, &bands.band[b].soft};
      for (int v = 0; v < 5; ++v) {
        *values[v] = static_cast<float>(ParamDouble(names[b * 5 + v].c_str()));
      }
    }

    // Never more rows than both frames hold: a foreground larger than the output is cut.
    myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcStride, dstStride);
    CxImage image(&dst, static_cast<unsigned>(dstWidth), static_cast<unsigned>(dstHeight), 32,
                  static_cast<unsigned>(dstStride), IPF_BGRA);
    hslAdjustment(&image, bands);
    return 0;
  }
};

const NLEHSLAdjustEffect::_auto_register s_register(L"AF91FF05-6577-4A4B-C81E-652EE7D6596E",
                                                    L"HSLAdjust", &NLEHSLAdjustEffect::create);

}  // namespace
