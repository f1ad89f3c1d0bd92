#include "effects/LutFileCache.h"

#include <climits>
#include <cstdint>
#include <cwchar>

#include "lut/OwnedCubeLut.h"
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

}  // namespace

CubeLut& LutFileCache::Table() {
  if (!table_) table_.reset(new OwnedCubeLut());
  return *table_;
}

bool LutFileCache::Refresh(const std::wstring& path) {
  Table();
  if (!loadedPath_.empty() && loadedPath_ == path) return false;
  loadedPath_ = TranslatePath(path);
  loaded_ = false;
  loaded_ = table_->loadFile(loadedPath_.c_str());
  if (loaded_) {
    plan_.Prepare(tfx::TetraTable{table_->getLut3DData(nullptr, nullptr, nullptr, nullptr),
                                  table_->getFTData(nullptr), table_->getGTData(nullptr),
                                  table_->getLutSize()});
  }
  return true;
}

bool CopyThroughTable(const tfx::TetraPlan& plan, uint8_t* dst, int dstWidth, int dstHeight,
                      int dstPitch, const uint8_t* src, int srcWidth, int srcHeight, int srcPitch) {
  if (!plan.Usable() || !dst || !src || dst == src || dstWidth < 1 || dstHeight < 1) return false;
  if (srcWidth != dstWidth || srcHeight < dstHeight || srcPitch != dstPitch) return false;
  const int64_t bytes = int64_t{dstWidth} * 4;
  if (dstPitch != bytes || bytes * dstHeight > INT_MAX) return false;
  tfx::TetraImage(plan, src, srcPitch, dst, dstWidth, dstHeight, dstPitch, 4);
  return true;
}
