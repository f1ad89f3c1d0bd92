// ChromeKeyLut3d: green- and blue-screen keying through generated 3D LUTs. Mode 0 turns the
// foreground into its key mask, mode 1 into its colours with the screen's spill removed; a host
// joins the two with ChromeKeyCombine.
#include "effects/ChromeKeyTables.h"
#include "plugin/NLEDynamicEffect.h"

namespace {

// Key colour, edge contrast and offset, and the output mode.
void RegisterParams(NLEFilterInfoComPtr& d) {
  const auto kInt = NLEFilterPropertyType_Int;
  const auto kDouble = NLEFilterPropertyType_Double;
  d.AddParam<int>(L"red", kInt, 0, 0, 255, 1, L"red", 0);
  d.AddParam<int>(L"green", kInt, 0, 0, 255, 1, L"green", 0);
  d.AddParam<int>(L"blue", kInt, 0, 0, 255, 1, L"blue", 0);
  d.AddParam<double>(L"contrast", kDouble, 50.0, 0.0, 100.0, 1.0, L"contrast", 0);
  d.AddParam<double>(L"offset", kDouble, 0.0, -100.0, 100.0, 0.1, L"offset", 0);
  d.AddParam<int>(L"mode", kInt, 0, 0, 1, 1, L"mode", 0);
}

class NLEChromeKeyLut3dEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEChromeKeyLut3dEffect(); }

  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int dstPitch, const uint8_t*, int, int,
                int, const uint8_t* src, int srcWidth, int srcHeight, int srcPitch) override {
    if (!dst || !src) return NLE_E_INVALIDARG;
    const int red = ParamInt(L"red");
    const int blue = ParamInt(L"blue");
    const int green = ParamInt(L"green");
    const double contrast = ParamDouble(L"contrast", 50.0);
    const double offset = ParamDouble(L"offset", 0.0);
    tables_.KeepCurrent(red, green, blue, contrast, offset);

    // Never more rows than both frames hold: a foreground larger than the output is cut.
    myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcPitch, dstPitch);
    const int mode = ParamInt(L"mode");
    if (mode == 1) {
      tables_.Beauty().doLUT(dst, dstWidth, dstHeight, dstPitch, 4);
    } else if (mode == 0) {
      tables_.Alpha().doLUT(dst, dstWidth, dstHeight, dstPitch, 4);
    }
    return 0;
  }

 private:
  ChromeKeyTables tables_;
};

const NLEChromeKeyLut3dEffect::_auto_register s_register(L"DB4BBA18-48FC-4164-B572-E59757B02796",
                                                         L"ChromeKeyLut3d",
                                                         &NLEChromeKeyLut3dEffect::create,
                                                         &RegisterParams);

}  // namespace
