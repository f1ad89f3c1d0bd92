// Base of every CPU effect: turns the host's Running call into one Transform call on packed
// 8-bit BGRA buffers, and owns the CPU filter registry.
#pragma once

#include <cstdint>
#include <cstring>
#include <map>
#include <string>
#include <utility>

#include "plugin/NLEBasicFilter.h"
#include "plugin/NLEFilterInfoComPtr.h"
#include "tessarofx/NLEHost.h"

class NLEDynamicEffect;

// One registry entry per GUID: the class's factory and its descriptor.
template <class Base>
using NLEFilterFactory = Base* (*)();
template <class Base>
using NLEClassSet =
    std::map<std::wstring, std::pair<NLEFilterFactory<Base>, NLEComPtr<INLEProperties>>>;

// Adds a class's parameter descriptors at registration.
using NLEParamRegistrar = void (*)(NLEFilterInfoComPtr& descriptor);

// Registration at load: inserts (guid -> factory, descriptor) into Base's registry unless the GUID
// is already there, names the descriptor and lets the class add its parameters.
template <class Base>
struct NLEAutoRegister {
  NLEAutoRegister(const wchar_t* guid, const wchar_t* friendName, NLEFilterFactory<Base> factory,
                  NLEParamRegistrar addParams = nullptr);
};

class NLEDynamicEffect : public NLEBasicFilter {
 public:
  using _auto_register = NLEAutoRegister<NLEDynamicEffect>;

  static NLEClassSet<NLEDynamicEffect>& get_class_set();
  // A new object of the class registered under guid, holding the registered defaults; null
  // when the GUID has no CPU class.
  static NLEDynamicEffect* create(const std::wstring& guid);

  HRESULT Prepare(CGFilterParam param) override;
  HRESULT Running(INLEFrame* dst) override;

  // The pixel work of an effect. src is the background, src2 the foreground; a missing frame
  // comes as a null pointer with zero sizes. Returns 0 or a negative code, passed to the host.
  virtual int Transform(uint8_t* dst, int dstW, int dstH, int dstPitch, const uint8_t* src,
                        int srcW, int srcH, int srcPitch, const uint8_t* src2, int src2W, int src2H,
                        int src2Pitch);
};

// Copies rows of pixels for effects that pass their input through. With differing pitches,
// every row is copied with the smaller pitch and BOTH buffers step by that smaller pitch;
// callers rely on that addressing, so it stays. `width` is not used.
bool myCopy(const uint8_t* src, uint8_t* dst, int width, int rows, int srcPitch, int dstPitch);

// For two frames of packed rows of dstWidth pixels where src has at least dst's rows: calls
// band(dstPixels, srcPixels, firstRow, rows) over cache-sized bands of rows, so that an effect
// that reads src and writes dst does what myCopy followed by its in-place pass would. Otherwise
// returns false and touches nothing.
template <class Band>
bool ForEachBand(uint8_t* dst, int dstWidth, int dstHeight, int dstStride, const uint8_t* src,
                 int srcHeight, int srcStride, Band band) {
  if (dstWidth <= 0 || dstHeight <= 0 || srcStride != dstStride ||
      static_cast<int64_t>(dstStride) != int64_t{dstWidth} * 4 || srcHeight < dstHeight) {
    return false;
  }
  const size_t rowBytes = static_cast<size_t>(dstStride);
  constexpr size_t kBandBytes = 32 * 1024;
  const int bandRows = rowBytes >= kBandBytes ? 1 : static_cast<int>(kBandBytes / rowBytes);
  for (int y = 0; y < dstHeight; y += bandRows) {
    const int rows = bandRows < dstHeight - y ? bandRows : dstHeight - y;
    const size_t offset = static_cast<size_t>(y) * rowBytes;
    band(dst + offset, src + offset, y, rows);
  }
  return true;
}

// ForEachBand for effects that work in place: each band is copied as myCopy copies it, then
// handed to band(pixels, firstRow, rows) while it is still in cache.
template <class Band>
bool CopyInBands(uint8_t* dst, int dstWidth, int dstHeight, int dstStride, const uint8_t* src,
                 int srcHeight, int srcStride, Band band) {
  return ForEachBand(dst, dstWidth, dstHeight, dstStride, src, srcHeight, srcStride,
                     [&](uint8_t* pixels, const uint8_t* from, int y, int rows) {
                       if (from != pixels) {
                         std::memcpy(pixels, from, static_cast<size_t>(rows) * dstStride);
                       }
                       band(pixels, y, rows);
                     });
}

template <class Base>
NLEAutoRegister<Base>::NLEAutoRegister(const wchar_t* guid, const wchar_t* friendName,
                                       NLEFilterFactory<Base> factory,
                                       NLEParamRegistrar addParams) {
  NLEComPtr<INLEProperties> descriptor;
  NLECommon::GetInterface(CLSID_NLEProperties, nullptr, 0, IID_INLEProperties,
                          reinterpret_cast<void**>(&descriptor));
  auto inserted = Base::get_class_set().emplace(guid, std::make_pair(factory, descriptor));
  NLEFilterInfoComPtr info(descriptor);
  info->SetString(NLEKey::Filter::kFilterFriendName, friendName);
  info->SetString(NLEKey::Filter::kFilterID, guid);
  if (addParams) addParams(info);
  (void)inserted;  // a GUID registered twice keeps its first class
}

// Looks guid up in Base's registry and returns a new object holding the registered defaults.
template <class Base>
Base* NLECreateRegistered(const std::wstring& guid) {
  auto& set = Base::get_class_set();
  auto it = set.find(guid);
  if (it == set.end() || !it->second.first) return nullptr;
  Base* object = it->second.first();
  if (object) object->CopyFromFilterProperty(it->second.second);
  return object;
}
