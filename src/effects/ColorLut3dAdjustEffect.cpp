// ColorLut3dAdjust: a 3D LUT file named by "lut3dPath" applied to the frame.
#include <algorithm>
#include <cstring>
#include <memory>
#include <string>

#include "effects/LutFileCache.h"
#include "plugin/NLEDynamicEffect.h"

namespace {

class NLEColorLut3dAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEColorLut3dAdjustEffect(); }

  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int dstPitch, const uint8_t*, int, int,
                int, const uint8_t* src, int srcWidth, int srcHeight, int srcPitch) override {
    if (!dst || !src) return NLE_E_INVALIDARG;
    const std::wstring path = GetParamWString(tfx::catalog::lut::kPath);
    if (path.empty()) return NLE_E_RESOURCE;
    lut_.Refresh(path);

    if (lut_.Loaded()) {
      if (CopyThroughTable(lut_.Plan(), dst, dstWidth, dstHeight, dstPitch, src, srcWidth,
                           srcHeight, srcPitch)) {
        return 0;
      }
      // Never more rows than both frames hold: a foreground larger than the output is cut.
      myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcPitch, dstPitch);
      // A refused table leaves the copy.
      tfx::TetraImage(lut_.Plan(), dst, dstPitch, dst, dstWidth, dstHeight, dstPitch, 4);
      return 0;
    }
    // One block of the output's size, as the frames are packed; cut to what both buffers hold.
    const int64_t want = static_cast<int64_t>(std::max(dstWidth, 0)) * std::max(dstHeight, 0) * 4;
    const int64_t dstBytes = static_cast<int64_t>(std::max(dstHeight, 0)) * std::max(dstPitch, 0);
    const int64_t srcBytes = static_cast<int64_t>(std::max(srcHeight, 0)) * std::max(srcPitch, 0);
    const int64_t bytes = std::min({want, dstBytes, srcBytes});
    if (bytes > 0 && dst != src) std::memcpy(dst, src, static_cast<size_t>(bytes));
    return 0;
  }

 private:
  LutFileCache lut_;
};

const NLEColorLut3dAdjustEffect::_auto_register s_register(tfx::catalog::kLut.wideGuid,
                                                           L"ColorLut3dAdjust",
                                                           &NLEColorLut3dAdjustEffect::create);

}  // namespace
