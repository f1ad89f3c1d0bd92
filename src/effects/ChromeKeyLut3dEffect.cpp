// ChromeKeyLut3d: green- and blue-screen keying through generated 3D LUTs. Mode 0 turns the
// foreground into its key mask, mode 1 into its colours with the screen's spill removed; a host
// joins the two with ChromeKeyCombine.
#include <cmath>
#include <memory>

#include "lut/ChromeKeyLut3dGenerator.h"
#include "plugin/NLEDynamicEffect.h"
#include "tessarofx/CubeLut.h"

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

uint8_t KeyByte(int v) { return static_cast<uint8_t>(v < 0 ? 0 : (v > 255 ? 255 : v)); }

class NLEChromeKeyLut3dEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEChromeKeyLut3dEffect(); }

  NLEChromeKeyLut3dEffect() : beauty_(new CubeLut()), alpha_(new CubeLut()) {
    // 64 points, so that doLUT walks the whole lattice the generator fills.
    beauty_->generateLUT3DData(NLEChromeKeyLut3dGenerator::kPoints);
    alpha_->generateLUT3DData(NLEChromeKeyLut3dGenerator::kPoints);
  }

  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int dstPitch, const uint8_t*, int, int,
                int, const uint8_t* src, int srcWidth, int srcHeight, int srcPitch) override {
    if (!dst || !src) return NLE_E_INVALIDARG;
    const int red = ParamInt(L"red");
    const int blue = ParamInt(L"blue");
    const int green = ParamInt(L"green");
    const double contrast = ParamDouble(L"contrast", 50.0);
    const double offset = ParamDouble(L"offset", 0.0);
    KeepTablesCurrent(red, green, blue, contrast, offset);

    // Never more rows than both frames hold: a foreground larger than the output is cut.
    myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcPitch, dstPitch);
    const int mode = ParamInt(L"mode");
    if (mode == 1) {
      beauty_->doLUT(dst, dstWidth, dstHeight, dstPitch, 4);
    } else if (mode == 0) {
      alpha_->doLUT(dst, dstWidth, dstHeight, dstPitch, 4);
    }
    return 0;
  }

 private:
  // Integer parameters arrive as numbers; an absent or non-numeric one reads as 0.
  int ParamInt(const wchar_t* name) const {
    const double v = ParamDouble(name);
    if (!(v > -2147483648.0 && v < 2147483648.0)) return 0;
    return static_cast<int>(v);
  }

  // Generating a table costs tens of milliseconds, so they follow the parameters only when these
  // move: the beauty LUT depends on the key colour alone, the alpha LUT on everything.
  void KeepTablesCurrent(int red, int green, int blue, double contrast, double offset) {
    const bool keyChanged = red != lastRed_ || green != lastGreen_ || blue != lastBlue_;
    if (keyChanged) {
      lastRed_ = red;
      lastGreen_ = green;
      lastBlue_ = blue;
    }
    const bool shapeChanged = contrast != lastContrast_ || offset != lastOffset_;
    if (shapeChanged) {
      lastContrast_ = contrast;
      lastOffset_ = offset;
    }
    if (!keyChanged && !shapeChanged) return;
    generator_.setLutParam(NLEChromeKeyLut3dGenerator::DefaultParam(
        KeyByte(red), KeyByte(green), KeyByte(blue), contrast, offset));
    if (keyChanged)
      generator_.getBeautyLut(beauty_->getLut3DData(nullptr, nullptr, nullptr, nullptr));
    generator_.getAlphaLut(alpha_->getLut3DData(nullptr, nullptr, nullptr, nullptr));
  }

  std::unique_ptr<CubeLut> beauty_;
  std::unique_ptr<CubeLut> alpha_;
  NLEChromeKeyLut3dGenerator generator_;
  // -1 never matches a parameter, so the first frame builds both tables.
  int32_t lastRed_ = -1, lastGreen_ = -1, lastBlue_ = -1;
  double lastContrast_ = -1.0, lastOffset_ = -1.0;
};

const NLEChromeKeyLut3dEffect::_auto_register s_register(L"DB4BBA18-48FC-4164-B572-E59757B02796",
                                                         L"ChromeKeyLut3d",
                                                         &NLEChromeKeyLut3dEffect::create,
                                                         &RegisterParams);

}  // namespace
