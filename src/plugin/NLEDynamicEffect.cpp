#include "plugin/NLEDynamicEffect.h"

#include <cstring>

#include "plugin/NLECGFrameWrapper.h"
#include "tessarofx/NLEHost.h"

NLEClassSet<NLEDynamicEffect>& NLEDynamicEffect::get_class_set() {
  static NLEClassSet<NLEDynamicEffect> set;
  return set;
}

NLEDynamicEffect* NLEDynamicEffect::create(const std::wstring& guid) {
  return NLECreateRegistered<NLEDynamicEffect>(guid);
}

HRESULT NLEDynamicEffect::Prepare(CGFilterParam) { return NLE_S_OK; }

HRESULT NLEDynamicEffect::Running(INLEFrame* dst) {
  if (!dst || (!Background() && !Foreground())) return NLE_E_INVALIDARG;
  if (Background() && Background() != dst) dst->Prepare();

  const NLERectF whole{0, 0, 1, 1};
  // Destroyed in reverse order: the destination writes back first.
  NLECGFrameWrapper fg(Foreground(), false, false, whole);
  NLECGFrameWrapper bg(Background(), false, false, whole);
  NLECGFrameWrapper out(dst, true, false, whole);
  return Transform(out.GetData(), out.GetWidth(), out.GetHeight(), out.GetPitch(), bg.GetData(),
                   bg.GetWidth(), bg.GetHeight(), bg.GetPitch(), fg.GetData(), fg.GetWidth(),
                   fg.GetHeight(), fg.GetPitch());
}

int NLEDynamicEffect::Transform(uint8_t*, int, int, int, const uint8_t*, int, int, int,
                                const uint8_t*, int, int, int) {
  return NLE_E_NOTIMPL;
}

bool myCopy(const uint8_t* src, uint8_t* dst, int width, int rows, int srcPitch, int dstPitch) {
  (void)width;
  if (!src || !dst || rows == 0 || srcPitch == 0 || dstPitch == 0) return false;
  if (rows < 0 || srcPitch < 0 || dstPitch < 0) return false;  // nothing sensible to copy
  if (srcPitch == dstPitch) {
    std::memcpy(dst, src, static_cast<size_t>(rows) * static_cast<size_t>(srcPitch));
    return true;
  }
  const size_t m = static_cast<size_t>(srcPitch < dstPitch ? srcPitch : dstPitch);
  for (int r = 0; r < rows; ++r) std::memcpy(dst + r * m, src + r * m, m);
  return true;
}
