// ColorLut3dAdjust: a 3D LUT file named by "lut3dPath" applied to the frame.
#include <algorithm>
#include <cstring>
#include <memory>
#include <string>

#include "plugin/NLEDynamicEffect.h"
#include "tessarofx/CubeLut.h"
#include "tessarofx/NLEHost.h"

namespace {

// The capacity of the buffer the host translates a path into.
constexpr uint32_t kTranslatedCapacity = 1024;

// The host's file-system form of a path as the user wrote it. Without the environment service,
// or when it cannot translate, the result is empty and no file is opened.
std::wstring TranslatePath(const std::wstring& path) {
  INLEEnviroment* env = nullptr;
  if (NLE_FAILED(NLECommon::GetInterface(CLSID_NLEEnviroment, nullptr, 0, IID_INLEEnviroment,
                                         reinterpret_cast<void**>(&env))) ||
      !env) {
    return std::wstring();
  }
  std::wstring out(kTranslatedCapacity, L'\0');
  env->TranslatePath(path.c_str(), out.data(), kTranslatedCapacity, nullptr);
  env->Release();
  out.resize(std::wcslen(out.c_str()));
  return out;
}

class NLEColorLut3dAdjustEffect final : public NLEDynamicEffect {
 public:
  static NLEDynamicEffect* create() { return new NLEColorLut3dAdjustEffect(); }

  int Transform(uint8_t* dst, int dstWidth, int dstHeight, int dstPitch, const uint8_t*, int, int,
                int, const uint8_t* src, int srcWidth, int srcHeight, int srcPitch) override {
    if (!dst || !src) return NLE_E_INVALIDARG;
    const std::wstring path = GetParamWString(L"lut3dPath");
    if (path.empty()) return NLE_E_RESOURCE;
    if (!table_) table_.reset(new CubeLut());

    // The stored path is the translated one while the parameter is compared untranslated, so a
    // path that translation changes ("~/...", "$LUTS/...") is read again on every frame, and a
    // failed load of one is retried. The effect has always behaved so; keep it.
    if (loadedPath_.empty() || loadedPath_ != path) {
      loadedPath_ = TranslatePath(path);
      loaded_ = false;
      loaded_ = table_->loadFile(loadedPath_.c_str());
    }

    if (loaded_) {
      // Never more rows than both frames hold: a foreground larger than the output is cut.
      myCopy(src, dst, srcWidth, srcHeight < dstHeight ? srcHeight : dstHeight, srcPitch, dstPitch);
      table_->doLUT(dst, dstWidth, dstHeight, dstPitch, 4);  // a refused table leaves the copy
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
  std::wstring loadedPath_;
  std::unique_ptr<CubeLut> table_;
  bool loaded_ = false;
};

const NLEColorLut3dAdjustEffect::_auto_register s_register(L"74EB022D-1D73-4D1E-9F70-487C356D46CD",
                                                           L"ColorLut3dAdjust",
                                                           &NLEColorLut3dAdjustEffect::create);

}  // namespace
