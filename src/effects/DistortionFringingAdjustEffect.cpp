// DistortionFringingAdjust: radial lens distortion, then lateral colour fringing.
#include "adjust/LensMaps.h"
#include "plugin/NLEDynamicEffect.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/LensAdjust.h"

namespace {

class NLEDistortionFringingAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEDistortionFringingAdjustEffect(); }

  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int dstStride, const uint8_t*, int, int,
                int, const uint8_t* src, int srcWidth, int srcHeight, int srcStride) override {
    if (!dst || !src) return NLE_E_INVALIDARG;
    // Percent values, passed on as floats; an absent one is a no-op.
    const float distortion = static_cast<float>(ParamDouble(tfx::catalog::lens::kDistortion));
    const float fringing = static_cast<float>(ParamDouble(tfx::catalog::lens::kFringing));

    CxImage image(&dst, static_cast<unsigned>(dstWidth), static_cast<unsigned>(dstHeight), 32,
                  static_cast<unsigned>(dstStride), IPF_BGRA);
    // With both frames packed alike the steps resample straight from the foreground, the
    // distortion into a frame of its own when fringing follows: the same bytes as copying the
    // foreground in and resampling copies, without the frame copies. The foreground is only read
    // through this wrapper.
    if (srcWidth == dstWidth && srcHeight == dstHeight && srcStride == dstStride &&
        dstStride == dstWidth * 4) {
      uint8_t* in = const_cast<uint8_t*>(src);
      const CxImage source(&in, static_cast<unsigned>(srcWidth), static_cast<unsigned>(srcHeight),
                           32, static_cast<unsigned>(srcStride), IPF_BGRA);
      if (fringing != 0.0f && distortion != 0.0f) {
        // Settings held for a second frame get the single pass; its offsets take longer to build
        // than a frame of two passes, which is what strengths that change every frame keep.
        const bool held = distortion == lastDistortion_ && fringing == lastFringing_;
        lastDistortion_ = distortion;
        lastFringing_ = fringing;
        if (held && (composite_.distortion != distortion || composite_.fringing != fringing ||
                     composite_.width != dstWidth || composite_.height != dstHeight)) {
          tfx::ComposeLens(distortion, fringing, dstWidth, dstHeight, &composite_);
        }
        if (held && tfx::DistortFringeFrom(source, &image, composite_)) {
          distorted_.Destroy();
          return 0;
        }
        // Kept between frames: a fresh frame-sized buffer costs its page faults every frame.
        if (!distorted_.GetBits() || distorted_.GetWidth() != unsigned(dstWidth) ||
            distorted_.GetHeight() != unsigned(dstHeight)) {
          distorted_.Create(static_cast<unsigned>(dstWidth), static_cast<unsigned>(dstHeight), 32,
                            IPF_BGRA);
        }
        if (tfx::DistortFrom(source, &distorted_, distortion) &&
            tfx::FringeFrom(distorted_, &image, fringing)) {
          return 0;
        }
      } else if (tfx::DistortFrom(source, &image, distortion) ||
                 tfx::FringeFrom(source, &image, fringing)) {
        return 0;
      }
    }
    // Never more rows than both frames hold: a foreground larger than the output is cut.
    myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcStride, dstStride);
    distortFilter(&image, distortion);
    fringingFilter(&image, fringing);
    return 0;
  }

 private:
  CxImage distorted_;
  tfx::LensComposite composite_;
  float lastDistortion_ = 0.0f;
  float lastFringing_ = 0.0f;
};

const NLEDistortionFringingAdjustEffect::_auto_register s_register(
    tfx::catalog::kLens.wideGuid, L"DistortionFringingAdjust",
    &NLEDistortionFringingAdjustEffect::create);

}  // namespace
