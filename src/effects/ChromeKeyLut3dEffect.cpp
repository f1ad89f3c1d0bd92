// ChromeKeyLut3d: green- and blue-screen keying through generated 3D LUTs. Mode 0 turns the
// foreground into its key mask, mode 1 into its colours with the screen's spill removed; a host
// joins the two with ChromeKeyCombine.
#include "effects/ChromeKeyTables.h"
#include "effects/EffectParams.h"
#include "effects/LutFileCache.h"
#include "plugin/NLEDynamicEffect.h"

namespace {

// Key colour, edge contrast and offset, and the output mode.
void RegisterParams(NLEFilterInfoComPtr& d) { RegisterCatalogParams(d, tfx::catalog::kChromeKey); }

class NLEChromeKeyLut3dEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEChromeKeyLut3dEffect(); }

  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int dstPitch, const uint8_t*, int, int,
                int, const uint8_t* src, int srcWidth, int srcHeight, int srcPitch) override {
    if (!dst || !src) return NLE_E_INVALIDARG;
    using namespace tfx::catalog::chroma_key;
    const int red = ParamInt(kRed);
    const int blue = ParamInt(kBlue);
    const int green = ParamInt(kGreen);
    const double contrast = ParamDouble(kContrast);
    const double offset = ParamDouble(kOffset);
    tables_.KeepCurrent(red, green, blue, contrast, offset);

    const int mode = ParamInt(kMode);
    const tfx::TetraPlan* plan =
        mode == 1 ? &tables_.BeautyPlan() : (mode == 0 ? &tables_.AlphaPlan() : nullptr);
    if (plan && CopyThroughTable(*plan, dst, dstWidth, dstHeight, dstPitch, src, srcWidth,
                                 srcHeight, srcPitch)) {
      return 0;
    }
    // Never more rows than both frames hold: a foreground larger than the output is cut.
    myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcPitch, dstPitch);
    if (plan) tfx::TetraImage(*plan, dst, dstPitch, dst, dstWidth, dstHeight, dstPitch, 4);
    return 0;
  }

 private:
  ChromeKeyTables tables_;
};

const NLEChromeKeyLut3dEffect::_auto_register s_register(tfx::catalog::kChromeKey.wideGuid,
                                                         L"ChromeKeyLut3d",
                                                         &NLEChromeKeyLut3dEffect::create,
                                                         &RegisterParams);

}  // namespace
